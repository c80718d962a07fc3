// Physical NICs of the Linux host: veth ends the configuration names as NICs, checked against
// what ip and ethtool say of them; the refusals of the veth driver (it has no rings, coalescing,
// pause, registers, EEPROM, self test or link settings to change) and of Linux itself (no
// netqueue balancer); reads without privileges and changes refused without them.
#include <regex>

#include "namespace_host.h"

namespace {

class NicsTest : public Hadro::Test::NamespaceHostTest {
protected:
    void SetUp() override {
        NamespaceHostTest::SetUp();
        if (IsSkipped()) return;
        // vmnic0's peer stays out of the NICs: the pattern names one character after "vmnic".
        Configure("nics = vmnic?\n");
        Sh("ip link add vmnic0 numtxqueues 4 numrxqueues 4 type veth peer name vmnic0p numtxqueues 4 "
           "numrxqueues 4 && ip link set vmnic0 up && ip link set vmnic0p up");
    }

    // The error of a command that must fail with exit status 1 (never 3).
    std::string Refused(const std::string& arguments) {
        auto result = Hadro(arguments);
        EXPECT_EQ(result.status, 1) << arguments << "\n" << result.All();
        return result.err;
    }

    // A value of ethtool's text output ("Speed: 10000Mb/s" for "Speed").
    std::string Ethtool(const std::string& options, const std::string& key) {
        std::smatch match;
        const std::string out = Sh("ethtool " + options);
        if (!std::regex_search(out, match, std::regex("(^|\\n)\\s*" + key + ":\\s*([^\\n]*)")))
            return "(none)";
        return match[2];
    }

    // Whether ethtool -k shows a feature (or a legacy switch such as tx-checksumming) active.
    bool Feature(const std::string& name) {
        return ShJson("ethtool --json -k vmnic0")[0][name]["active"] == true;
    }
};

TEST_F(NicsTest, ListAndGetAgreeWithIpAndEthtool) {
    auto list = HadroJson("network nic list");
    ASSERT_EQ(list.size(), 1u) << list.dump();  // vmnic0p and lo are no NICs
    const auto link = ShJson("ip -j link show vmnic0")[0];
    EXPECT_EQ(list[0]["Name"], "vmnic0");
    EXPECT_EQ(list[0]["PCI Device"], "Pseudo");
    EXPECT_EQ(list[0]["Driver"], Ethtool("-i vmnic0", "driver"));
    EXPECT_EQ(list[0]["MAC Address"], link["address"]);
    EXPECT_EQ(list[0]["MTU"], link["mtu"]);
    EXPECT_EQ(list[0]["Admin Status"], "Up");
    EXPECT_EQ(list[0]["Link Status"], "Up");
    EXPECT_EQ(list[0]["Link"], "Up");
    EXPECT_EQ(std::to_string(list[0]["Speed"].get<int>()) + "Mb/s", Ethtool("vmnic0", "Speed"));
    EXPECT_EQ(list[0]["Duplex"], Ethtool("vmnic0", "Duplex"));
    EXPECT_EQ(list[0]["Description"], "Unknown Unknown");

    auto nic = HadroJson("network nic get -n vmnic0");
    EXPECT_EQ(nic["Cable Type"], Ethtool("vmnic0", "Port"));
    EXPECT_EQ(nic["Transceiver"], Ethtool("vmnic0", "Transceiver"));
    EXPECT_EQ(std::to_string(nic["PHY Address"].get<int>()), Ethtool("vmnic0", "PHYAD"));
    EXPECT_EQ(nic["Auto Negotiation"], Ethtool("vmnic0", "Auto-negotiation") == "on");
    EXPECT_EQ(nic["Link Detected"], Ethtool("vmnic0", "Link detected") == "yes");
    EXPECT_EQ(nic["Supported Ports"], nlohmann::json::array());
    EXPECT_EQ(nic["Advertised Link Modes"], nlohmann::json::array());
    // veth has no Wake-on-LAN, no message level and no pause, and no permanent address: the
    // MAC address it carries is a virtual one.
    EXPECT_EQ(nic["Supports Wakeon"], false);
    EXPECT_EQ(nic["Wakeon"], nlohmann::json::array({"None"}));
    EXPECT_EQ(nic["Current Message Level"], -1);
    EXPECT_EQ(nic["Supports Pause"], false);
    EXPECT_EQ(nic["Virtual Address"], link["address"]);
    EXPECT_EQ(nic["Link Status"], "Up");
    EXPECT_EQ(nic["Driver Info"]["Driver"], Ethtool("-i vmnic0", "driver"));
    EXPECT_EQ(nic["Driver Info"]["Version"], Ethtool("-i vmnic0", "version"));

    // Down: no link, and with it no speed.
    ASSERT_EQ(Hadro("network nic down -n vmnic0").status, 0);
    EXPECT_EQ(ShJson("ip -j link show vmnic0")[0]["operstate"], "DOWN");
    list = HadroJson("network nic list");
    EXPECT_EQ(list[0]["Admin Status"], "Down");
    EXPECT_EQ(list[0]["Link"], "Down");
    EXPECT_EQ(list[0]["Speed"], 0);
    EXPECT_EQ(list[0]["Duplex"], "Half");
    EXPECT_EQ(HadroJson("network nic get -n vmnic0")["Link Status"], "Down");
    ASSERT_EQ(Hadro("network nic up -n vmnic0").status, 0);
    EXPECT_EQ(ShJson("ip -j link show vmnic0")[0]["operstate"], "UP");
}

TEST_F(NicsTest, TheVirtualAddressIsTheMacAddressThroughRtnetlink) {
    ASSERT_EQ(Hadro("network nic set -n vmnic0 -V 02:00:00:00:00:42").status, 0);
    EXPECT_EQ(ShJson("ip -j link show vmnic0")[0]["address"], "02:00:00:00:00:42");
    EXPECT_EQ(HadroJson("network nic get -n vmnic0")["Virtual Address"], "02:00:00:00:00:42");
    EXPECT_EQ(HadroJson("network nic list")[0]["MAC Address"], "02:00:00:00:00:42");
    EXPECT_EQ(Refused("network nic set -n vmnic0 -V 01:00:5e:00:00:01"),
              "Invalid virtual address '01:00:5e:00:00:01': expected a unicast MAC address such as "
              "02:00:00:00:00:01\n");
    EXPECT_EQ(Refused("network nic set -n vmnic0 -V ''"),
              "vmnic0 has no permanent MAC address to go back to: give a virtual address\n");
    EXPECT_EQ(ShJson("ip -j link show vmnic0")[0]["address"], "02:00:00:00:00:42");
}

TEST_F(NicsTest, OffloadsAgreeWithEthtoolAndChangeAsEthtoolWould) {
    auto cso = HadroJson("network nic cso get -n vmnic0")[0];
    EXPECT_EQ(cso["RX Checksum Offload"], Feature("rx-checksumming") ? "on" : "off");
    EXPECT_EQ(cso["TX Checksum Offload"], Feature("tx-checksumming") ? "on" : "off");

    ASSERT_EQ(Hadro("network nic tso set -n vmnic0 -e 0").status, 0);
    EXPECT_FALSE(Feature("tcp-segmentation-offload"));
    EXPECT_EQ(HadroJson("network nic tso get -n vmnic0")[0]["Value"], "off");
    ASSERT_EQ(Hadro("network nic tso set -n vmnic0 -e 1").status, 0);
    EXPECT_TRUE(Feature("tcp-segmentation-offload"));

    ASSERT_EQ(Hadro("network nic sg set -n vmnic0 -e 0").status, 0);
    EXPECT_FALSE(Feature("scatter-gather"));
    EXPECT_EQ(HadroJson("network nic sg get -n vmnic0")[0]["Value"], "off");
    EXPECT_EQ(HadroJson("network nic tso get -n vmnic0")[0]["Value"],
              Feature("tcp-segmentation-offload") ? "on" : "off");
    ASSERT_EQ(Hadro("network nic sg set -n vmnic0 -e 1").status, 0);
    EXPECT_TRUE(Feature("scatter-gather"));

    // Without checksum offload the kernel drops TSO: asking for it back is refused with what
    // the kernel kept.
    ASSERT_EQ(Hadro("network nic cso set -n vmnic0 -e 0").status, 0);
    EXPECT_FALSE(Feature("rx-checksumming"));
    EXPECT_FALSE(Feature("tx-checksumming"));
    EXPECT_EQ(HadroJson("network nic cso get")[0]["TX Checksum Offload"], "off");
    EXPECT_EQ(HadroJson("network nic tso get")[0]["Value"],
              Feature("tcp-segmentation-offload") ? "on" : "off");
    EXPECT_EQ(
        Refused("network nic tso set -n vmnic0 -e 1")
            .rfind(
                "Cannot change TCP segmentation offload of vmnic0: the kernel keeps tx-tcp-segmentation off",
                0),
        0u);
    ASSERT_EQ(Hadro("network nic cso set -n vmnic0 -e 1").status, 0);
    EXPECT_TRUE(Feature("tx-checksumming"));

    // Generic segmentation offload is the software TSO of Linux.
    EXPECT_EQ(HadroJson("network nic software list -n vmnic0")[0]["IPv4 TSO"],
              Feature("generic-segmentation-offload") ? "on" : "off");
    ASSERT_EQ(Hadro("network nic software set -n vmnic0 --ipv4tso false --ipv6tso false").status, 0);
    EXPECT_FALSE(Feature("generic-segmentation-offload"));
    auto software = HadroJson("network nic software list -n vmnic0")[0];
    EXPECT_EQ(software["IPv6 TSO"], "off");
    EXPECT_EQ(software["IPv4 CSO"], "on");
    EXPECT_EQ(Refused("network nic software set -n vmnic0 --ipv4tso true --ipv6tso false"),
              "Linux does IPv4 TCP segmentation, IPv6 TCP segmentation in software with one switch, generic "
              "segmentation offload (tx-generic-segmentation): give them the same value\n");
    EXPECT_EQ(
        Refused("network nic software set -n vmnic0 --highdma false"),
        "Linux always does high DMA (bounce buffers) in software for a NIC that cannot: it cannot be turned "
        "off\n");
    EXPECT_FALSE(Feature("generic-segmentation-offload"));
}

TEST_F(NicsTest, QueueCountsAreTheChannels) {
    auto counts = HadroJson("network nic queue count get -n vmnic0")[0];
    EXPECT_EQ(counts["Tx netqueue count"], 4);
    EXPECT_EQ(counts["Rx netqueue count"], 4);
    ASSERT_EQ(Hadro("network nic queue count set -n vmnic0 --tx true -q 2").status, 0);
    EXPECT_EQ(Ethtool("-l vmnic0", "Current hardware settings:\\s*RX:\\s*\\d+\\s*TX"), "2");
    counts = HadroJson("network nic queue count get")[0];
    EXPECT_EQ(counts["Tx netqueue count"], 2);
    EXPECT_EQ(counts["Rx netqueue count"], 4);
    EXPECT_EQ(Refused("network nic queue count set -n vmnic0 --rx true --tx true -q 9"),
              "Cannot change the channels of vmnic0: requested channel count exceeds maximum\n");
    EXPECT_EQ(HadroJson("network nic queue count get -n vmnic0")[0]["Tx netqueue count"], 2);
}

TEST_F(NicsTest, LinuxHasNoNetqueueBalancer) {
    auto settings = HadroJson("network nic queue loadbalancer list")[0];
    EXPECT_EQ(settings["NIC"], "vmnic0");
    EXPECT_EQ(settings["RSS"], "UD");  // veth keeps no RSS indirection table
    EXPECT_EQ(settings["LRO"], "UD");  // nor lets rx-lro change
    EXPECT_EQ(settings["RxQNoFeature"], "ND");
    EXPECT_EQ(HadroJson("network nic queue loadbalancer state list")[0]["Enabled"], false);
    EXPECT_EQ(HadroJson("network nic queue loadbalancer plugin list"), nlohmann::json::array());
    auto classes = HadroJson("network nic queue filterclass list");
    EXPECT_EQ(classes[0]["MacOnly"], false);
    EXPECT_EQ(classes[0]["Vxlan"], false);

    EXPECT_EQ(
        Refused("network nic queue loadbalancer state set -n vmnic0 -e true"),
        "The netqueue balancer is not available on a Linux host: the kernel has no queue load balancer; "
        "received traffic is spread over a NIC's queues by RSS, which its driver does\n");
    EXPECT_EQ(
        Refused("network nic queue loadbalancer plugin set -n vmnic0 -e true -m mod -p plug"),
        "Netqueue balancer plugins are not available on a Linux host: the kernel has none (mod/plug)\n");
    EXPECT_EQ(
        Refused("network nic queue loadbalancer set -n vmnic0 --rxqpair true --rsslb true"),
        "The netqueue load balancer feature RxQPair is not available on a Linux host: only RSS (the driver's "
        "indirection table) and LRO (the rx-lro feature) can be set\n");
    EXPECT_EQ(Refused("network nic queue loadbalancer set -n vmnic0 --rsslb true"),
              "Cannot change the RSS indirection table of vmnic0: Operation not supported\n");
    EXPECT_EQ(Refused("network nic queue loadbalancer set -n vmnic0 --lrolb true"),
              "Cannot turn on large receive offload on vmnic0: the driver (veth) does not let it change\n");
    EXPECT_EQ(Hadro("network nic queue loadbalancer set -n vmnic0").status, 0);  // nothing asked
}

TEST_F(NicsTest, TheVethDriverRefusesWhatItDoesNotHave) {
    const std::map<std::string, std::string> refusals = {
        {"network nic ring preset get -n vmnic0",
         "Cannot read the ring sizes of vmnic0: Operation not supported"},
        {"network nic ring current get -n vmnic0",
         "Cannot read the ring sizes of vmnic0: Operation not supported"},
        {"network nic ring current set -n vmnic0 -r 256",
         "Cannot change the ring sizes of vmnic0: Operation not supported"},
        {"network nic coalesce set -n vmnic0 -r 5",
         "Cannot read the coalesce parameters of vmnic0: Operation not supported"},
        {"network nic coalesce low get -n vmnic0",
         "Cannot read the coalesce parameters of vmnic0: Operation not supported"},
        {"network nic coalesce high set -n vmnic0 -p 10",
         "Cannot read the coalesce parameters of vmnic0: Operation not supported"},
        {"network nic pauseParams set -n vmnic0 --rx true",
         "Cannot change the pause parameters of vmnic0: Operation not supported"},
        {"network nic set -n vmnic0 -S 1000 -D full",
         "Cannot change the speed and duplex of vmnic0: Operation not supported"},
        {"network nic set -n vmnic0 -a", "Cannot change auto-negotiation of vmnic0: Operation not supported"},
        {"network nic set -n vmnic0 -p fibre",
         "Cannot change the port and PHY address of vmnic0: Operation not supported"},
        {"network nic set -n vmnic0 -P 3",
         "Cannot change the port and PHY address of vmnic0: Operation not supported"},
        {"network nic set -n vmnic0 -t external",
         "Cannot change the transceiver of vmnic0: the kernel reports the transceiver type but does not set "
         "it"},
        {"network nic set -n vmnic0 -w g", "Not Support wol."},
        {"network nic set -n vmnic0 -l 1", "Not Support msglvl."},
        {"network nic register dump -n vmnic0",
         "Cannot dump the registers of vmnic0: Operation not supported"},
        {"network nic eeprom dump -n vmnic0 -o 4 -l 8",
         "Cannot dump the EEPROM of vmnic0: Operation not supported"},
        {"network nic eeprom change -n vmnic0 -o 0 -v 1 -m 5",
         "Cannot write the EEPROM of vmnic0: Operation not supported"},
        {"network nic eeprom change -n vmnic0 -f /etc/hostname",
         "Cannot write the EEPROM of vmnic0: Operation not supported"},
        {"network nic selftest run -n vmnic0", "Cannot run the self test of vmnic0: Operation not supported"},
        {"network nic selftest run -n vmnic0 -o 1",
         "Cannot run the self test of vmnic0: Operation not supported"},
        {"network nic negotiate restart -n vmnic0",
         "Cannot restart auto-negotiation on vmnic0: Operation not supported"},
    };
    for (const auto& [arguments, message] : refusals)
        EXPECT_EQ(Refused(arguments), message + "\n") << arguments;
    // What no NIC takes is refused before the driver is asked.
    EXPECT_EQ(Refused("network nic set -n vmnic0 -P 40"), "PHY address 40 is out of range (0 to 31)\n");
    EXPECT_EQ(Refused("network nic eeprom change -n vmnic0 -o 0 -v 1 -m -1"),
              "Magic key -1 does not fit in 32 bits\n");
    EXPECT_EQ(Refused("network nic eeprom change -n vmnic0 -o 0 -v 4294967296"),
              "EEPROM value 4294967296 does not fit in a double word\n");

    // The listings show what the driver cannot say as not available, and go on.
    auto coalesce = HadroJson("network nic coalesce get")[0];
    EXPECT_EQ(coalesce["RX microseconds"], "N/A");
    auto pause = HadroJson("network nic pauseParams list -n vmnic0")[0];
    EXPECT_EQ(pause["Pause Params Supported"], false);
    EXPECT_NE(Try("ethtool -a vmnic0").status, 0);  // ethtool cannot read them either
}

TEST_F(NicsTest, CountersAgreeWithIp) {
    // Traffic over the pair, with vmnic0p in a namespace of its own and IPv6 (its router
    // solicitations) out of the way so that the counters stand still.
    Sh("ip netns add peer && ip link set vmnic0p netns peer && sysctl -qw "
       "net.ipv6.conf.vmnic0.disable_ipv6=1 && "
       "ip netns exec peer sysctl -qw net.ipv6.conf.vmnic0p.disable_ipv6=1 && "
       "ip addr add 10.9.0.1/24 dev vmnic0 && ip netns exec peer ip addr add 10.9.0.2/24 dev vmnic0p && "
       "ip netns exec peer ip link set vmnic0p up && sleep 0.2 && "
       "bash -c 'for i in 1 2 3; do echo hello > /dev/udp/10.9.0.2/9; done' && sleep 0.3");
    auto stats = HadroJson("network nic stats get -n vmnic0")[0];
    const auto link = ShJson("ip -j -s link show vmnic0")[0]["stats64"];
    EXPECT_EQ(stats["NIC Name"], "vmnic0");
    EXPECT_GE(stats["Packets sent"].get<long>(), 4);  // ARP and three datagrams
    EXPECT_EQ(stats["Packets sent"], link["tx"]["packets"]);
    EXPECT_EQ(stats["Packets received"], link["rx"]["packets"]);
    EXPECT_EQ(stats["Bytes sent"], link["tx"]["bytes"]);
    EXPECT_EQ(stats["Bytes received"], link["rx"]["bytes"]);
    EXPECT_EQ(stats["Multicast packets received"], link["rx"]["multicast"]);
    EXPECT_EQ(stats["Receive packets dropped"], link["rx"]["dropped"]);
    EXPECT_EQ(stats["Total transmit errors"], link["tx"]["errors"]);
    EXPECT_EQ(stats["Broadcast packets sent"], 0);  // veth keeps no IEEE 802.3 MAC counters
}

TEST_F(NicsTest, NamesThatAreNoNicsAreRefusedByEachCommand) {
    const std::map<std::string, std::string> refusals = {
        {"network nic get -n vmnic0p", "There is no pnic with name vmnic0p"},
        {"network nic up -n lo", "There is no pnic with name lo"},
        {"network nic set -n ../vmnic0 -a", "There is no pnic with name ../vmnic0"},
        {"network nic coalesce get -n nowhere", "Pnic with name nowhere not found"},
        {"network nic pauseParams set -n vmnic0p --rx true", "NIC with name vmnic0p not found"},
        {"network nic software list -n vmnic0 -n vmnic9", "Can't find PNIC with name vmnic9"},
        {"network nic register dump -n vmnic0p", "Pnic with name vmnic0p not found"},
        {"network nic queue loadbalancer state list -n vmnic0p", "Invalid PNIC name vmnic0p"},
        {"network nic queue count get -n averyveryverylongname",
         "Pnic with name averyveryverylongname not found"},
        {"network nic stats get -n nowhere",
         "Unable to get stats for NIC: Physical NIC nowhere does not exist"},
        {"network nic stats get -n vmnic0p",
         "Unable to get stats for NIC: vmnic0p is not a physical NIC: no device backs it in sysfs and the "
         "nics "
         "line of the configuration does not name it"},
    };
    for (const auto& [arguments, message] : refusals)
        EXPECT_EQ(Refused(arguments), message + "\n") << arguments;
    // VLAN counters belong to switch uplinks: whatever the switches say, no unexpected failure.
    EXPECT_NE(Refused("network nic vlan stats get -n vmnic0"), "");
}

TEST_F(NicsTest, AnyUserReadsOnlyRootChanges) {
    auto list = HadroUnprivileged("--formatter=json network nic list");
    EXPECT_EQ(list.status, 0) << list.All();
    EXPECT_NE(list.out.find("\"vmnic0\""), std::string::npos);
    // The kernel shows Wake-on-LAN to root only: another user is told so.
    auto nic = HadroUnprivileged("network nic get -n vmnic0");
    EXPECT_EQ(nic.status, 0) << nic.All();
    EXPECT_EQ(nic.err,
              "Warning: the Wake-on-LAN settings of vmnic0 are shown as unsupported: reading them needs root "
              "(CAP_NET_ADMIN)\n");
    EXPECT_EQ(HadroUnprivileged("network nic tso get").status, 0);
    EXPECT_EQ(HadroUnprivileged("network nic queue count get").status, 0);

    const std::string needsRoot = "Changing the host's network needs root (CAP_NET_ADMIN)\n";
    for (const char* change :
         {"network nic down -n vmnic0", "network nic set -n vmnic0 -V 02:00:00:00:00:07",
          "network nic tso set -n vmnic0 -e 0", "network nic queue count set -n vmnic0 --tx true -q 1",
          "network nic selftest run -n vmnic0", "network nic negotiate restart -n vmnic0",
          "network nic eeprom change -n vmnic0 -o 0 -v 1"}) {
        auto refused = HadroUnprivileged(change);
        EXPECT_EQ(refused.status, 1) << change;
        // The last line (nic set reads the settings first, with the warning on Wake-on-LAN).
        const auto last = refused.err.rfind('\n', refused.err.size() - 2);
        EXPECT_EQ(last == std::string::npos ? refused.err : refused.err.substr(last + 1), needsRoot)
            << change;
    }
    auto registers = HadroUnprivileged("network nic register dump -n vmnic0");
    EXPECT_EQ(
        registers.err,
        "Cannot dump the registers of vmnic0: Operation not permitted (it needs root: CAP_NET_ADMIN)\n");
    const auto link = ShJson("ip -j link show vmnic0")[0];
    EXPECT_EQ(link["operstate"], "UP");
    EXPECT_NE(link["address"], "02:00:00:00:00:07");
    EXPECT_TRUE(Feature("tcp-segmentation-offload"));
}

}  // namespace

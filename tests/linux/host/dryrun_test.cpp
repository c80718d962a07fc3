// --dry-run on the Linux host: a change lists its host-control calls, each followed by the
// kernel requests it would make, naming their objects, and the kernel, the files and the
// host's document stay as they were, as ip, nft, tc and ip xfrm show them.
#include <algorithm>
#include <fstream>
#include <set>
#include <sstream>
#include <vector>

#include "namespace_host.h"

namespace {

using Hadro::Test::Has;
using Hadro::Test::HostResult;
using Hadro::Test::Slurp;

constexpr const char* kOwn = " (netstack defaultTcpipStack)";

// The kernel's lines of a dry run's output (and the line that ends one early), in order.
std::vector<std::string> KernelLines(const std::string& out) {
    std::vector<std::string> lines;
    std::istringstream in(out);
    for (std::string line; std::getline(in, line);) {
        if (line.rfind("kernel: ", 0) == 0 || line.rfind("dry run ends here: ", 0) == 0)
            lines.push_back(line);
    }
    return lines;
}

class DryRunTest : public Hadro::Test::NamespaceHostTest {
protected:
    // a0 (10.1.0.1/24) and its peer a1; NICs e1 and e2; switch vs1 with uplink e1 and port
    // groups pg and pg2.
    void SetUp() override {
        NamespaceHostTest::SetUp();
        if (IsSkipped() || dir_.empty()) return;
        Configure("nics = e?\n");
        // Addresses that settle at once: no duplicate address detection.
        Sh("sysctl -qw net.ipv6.conf.all.accept_dad=0 net.ipv6.conf.default.accept_dad=0");
        Sh("ip link add a0 type veth peer name a1 && ip addr add 10.1.0.1/24 dev a0 && ip link set a0 up && "
           "ip link set a1 up");
        Sh("ip link add e1 type veth peer name e1-peer && ip link add e2 type veth peer name e2-peer && "
           "ip link set e2 up");
        for (const char* step :
             {"vswitch standard add -v vs1", "vswitch standard uplink add -v vs1 -u e1",
              "vswitch standard portgroup add -v vs1 -p pg", "vswitch standard portgroup add -v vs1 -p pg2"})
            ASSERT_EQ(Hadro(std::string("network ") + step).status, 0) << step;
    }

    // Everything a change could touch, as the peer tools and the files show it: what was
    // configured, without what the kernel changes of its own accord meanwhile (timers, the
    // carrier of a bridge whose ports come and go).
    std::string Host() {
        std::string text;
        for (const char* command :
             {"ip -j -d link show", "ip -j -d addr show", "ip -j -d route show table all",
              "ip -j -d -6 route show table all", "ip -j -d rule show", "tc -j qdisc show",
              "bridge -j fdb show", "nft -j list ruleset"})
            text += std::string(command) + ":\n" + Configured(ShJson(command)).dump() + "\n";
        for (const char* command : {"ip xfrm policy", "ip xfrm state", "ls -A /run/netns /etc/netns",
                                    "sysctl net.core.somaxconn net.ipv4.tcp_congestion_control "
                                    "net.ipv6.conf.all.disable_ipv6"})
            text += std::string(command) + ":\n" + Try(command).All();
        return text + "resolv.conf:\n" + Slurp("/etc/resolv.conf") + "document:\n" + Slurp(document_);
    }

    static nlohmann::json Configured(const nlohmann::json& value) {
        static const std::set<std::string> kCarrier{"NO-CARRIER", "LOWER_UP", "M-DOWN", "linkdown"};
        if (value.is_array()) {
            nlohmann::json out = nlohmann::json::array();
            for (const auto& item : value) {
                if (!(item.is_string() && kCarrier.count(item.get<std::string>())))
                    out.push_back(Configured(item));
            }
            return out;
        }
        if (!value.is_object()) return value;
        nlohmann::json out = nlohmann::json::object();
        for (const auto& [key, item] : value.items()) {
            const bool timer = key.size() > 6 && key.compare(key.size() - 6, 6, "_timer") == 0;
            if (!timer && key != "operstate" && key != "state") out[key] = Configured(item);
        }
        return out;
    }

    // A dry run of a change that succeeds: its kernel lines, the host unchanged.
    std::vector<std::string> Rehearse(const std::string& arguments) {
        const std::string before = Host();
        HostResult result = Hadro("--dry-run " + arguments);
        EXPECT_EQ(result.status, 0) << arguments << "\n" << result.All();
        // Nothing on stderr but the warnings the real run gives too.
        std::istringstream err(result.err);
        for (std::string line; std::getline(err, line);)
            EXPECT_EQ(line.rfind("Warning: ", 0), 0u) << arguments << ": " << line;
        // Each kernel line follows the call that made it.
        EXPECT_NE(result.out.rfind("kernel: ", 0), 0u) << result.out;
        EXPECT_NE(result.out.find("::"), std::string::npos) << result.out;
        EXPECT_EQ(Host(), before) << arguments;
        return KernelLines(result.out);
    }
};

TEST_F(DryRunTest, InterfacesRoutesAndResolverFilesAreListedNotChanged) {
    EXPECT_EQ(
        Rehearse("network ip interface ipv4 set -i a0 -t static -I 10.1.0.5 -N 255.255.255.0 -g 10.1.0.9"),
        (std::vector<std::string>{
            std::string("kernel: address delete 10.1.0.1/24 dev a0") + kOwn,
            std::string("kernel: address add 10.1.0.5/24 dev a0") + kOwn,
            std::string("kernel: route add default via 10.1.0.9 dev a0 table main proto static") + kOwn,
        }));
    EXPECT_EQ(
        Rehearse("network ip route ipv4 add -n 10.2.0.0/16 -g 10.1.0.2"),
        (std::vector<std::string>{std::string("kernel: route add 10.2.0.0/16 via 10.1.0.2 dev a0 table main "
                                              "proto static") +
                                  kOwn}));
    EXPECT_EQ(Rehearse("network ip dns server add -s 10.9.9.9"),
              (std::vector<std::string>{
                  "kernel: file write /etc/resolv.conf (nameserver 192.0.2.53, nameserver 10.9.9.9)"}));
    EXPECT_EQ(Rehearse("network ip interface set -i a0 -m 9000 -e false"),
              (std::vector<std::string>{std::string("kernel: link set a0 down") + kOwn,
                                        std::string("kernel: link set a0 mtu 9000") + kOwn}));
}

TEST_F(DryRunTest, NetstacksAreNotMade) {
    const auto lines = Rehearse("network ip netstack add -N glidex2");
    ASSERT_GE(lines.size(), 4u);
    EXPECT_EQ(lines[0], "kernel: namespace add glidex2");
    EXPECT_EQ(lines[1], "kernel: link set lo up (netstack glidex2)");
    EXPECT_EQ(lines[2], "kernel: sysctl net.core.somaxconn = 11000 (netstack glidex2)") << lines[2];
    EXPECT_TRUE(Has(lines[3], "kernel: sysctl net.ipv4.tcp_congestion_control = ")) << lines[3];
    EXPECT_EQ(lines.back(), "kernel: file write " + document_ + " (the host's document: netstacks)");
    // A netstack the kernel has is refused as by the real run.
    Sh("ip netns add glidex3");
    auto taken = Hadro("--dry-run network ip netstack add -N glidex3");
    EXPECT_EQ(taken.status, 1);
    EXPECT_EQ(taken.err, Hadro("network ip netstack add -N glidex3").err);
}

TEST_F(DryRunTest, NicsSwitchesPortGroupsAndPoliciesAreListedNotChanged) {
    EXPECT_EQ(Rehearse("network nic down -n e2"),
              (std::vector<std::string>{std::string("kernel: link set e2 down") + kOwn}));
    EXPECT_EQ(
        Rehearse("network vswitch standard add -v vs2"),
        (std::vector<std::string>{std::string("kernel: link add vs2 type bridge mtu 1500") + kOwn,
                                  std::string("kernel: link set vs2 up") + kOwn,
                                  "kernel: file write " + document_ + " (the host's document: vswitches)"}));
    Sh("ip link add vs3 type bridge && ip link set vs3 up");
    auto uplink = Rehearse("network vswitch standard uplink add -v vs3 -u e2");
    ASSERT_FALSE(uplink.empty());
    EXPECT_EQ(uplink[0], std::string("kernel: link set e2 master vs3") + kOwn);
    EXPECT_EQ(
        Rehearse("network vswitch standard portgroup add -v vs1 -p pg3"),
        (std::vector<std::string>{"kernel: file write " + document_ + " (the host's document: vswitches)"}));
    // Shaping reaches every port of the switch: its uplink here.
    auto shaping =
        Rehearse("network vswitch standard policy shaping set -v vs1 -e true -b 1000 -k 2000 -t 100");
    ASSERT_EQ(shaping.size(), 2u);
    EXPECT_TRUE(Has(shaping[0], "kernel: qdisc replace dev e1 root tbf rate 125000 bytes/s burst "))
        << shaping[0];
    EXPECT_TRUE(Has(shaping[0], "peakrate 250000 bytes/s")) << shaping[0];
}

TEST_F(DryRunTest, InterfacesOnPortGroupsAreListedStepByStep) {
    // The pair is made down, then each end goes up and the bridge end joins the switch: later
    // steps find the devices the dry run did not make.
    auto lines = Rehearse("network ip interface add -p pg -M 02:aa:bb:cc:dd:ee -m 9000");
    ASSERT_GE(lines.size(), 5u);
    EXPECT_TRUE(Has(lines[0], "kernel: link add tkn0-port type veth mtu 1500 address fe:")) << lines[0];
    EXPECT_TRUE(Has(lines[0], " peer tkn0 mtu 9000 address 02:aa:bb:cc:dd:ee numrxqueues ")) << lines[0];
    EXPECT_EQ(lines[1], std::string("kernel: link set tkn0 up") + kOwn);
    EXPECT_EQ(lines[2], std::string("kernel: link set tkn0-port up") + kOwn);
    EXPECT_EQ(lines[3], std::string("kernel: link set tkn0-port master vs1") + kOwn);
    EXPECT_EQ(lines.back(), "kernel: file write " + document_ + " (the host's document: vswitches)");

    // In a netstack the dry run would make, the devices it would make are all there is.
    lines = Rehearse("network ip interface add -p pg2 -N PellixProvisioning -M 02:aa:bb:cc:dd:ef");
    ASSERT_FALSE(lines.empty());
    EXPECT_EQ(lines[0], "kernel: namespace add PellixProvisioning");
    EXPECT_NE(std::find(lines.begin(), lines.end(), "kernel: link set tkn0 up (netstack PellixProvisioning)"),
              lines.end());

    // Where the real run needs what only the kernel would tell (the address it gives a new
    // interface, for a switch that refuses MAC changes), the dry run says so and ends there.
    ASSERT_EQ(Hadro("network vswitch standard policy security set -v vs1 -m false").status, 0);
    lines = Rehearse("network ip interface add -p pg2");
    ASSERT_FALSE(lines.empty());
    EXPECT_EQ(
        lines.back(),
        "dry run ends here: the real run would next read the MAC address the kernel gives tkn0 and carry "
        "out the security policy on tkn0-port with it (a static forwarding entry of that address, then "
        "the port flags)");
}

TEST_F(DryRunTest, FirewallAndIpsecAreCheckedNotChanged) {
    auto load = Rehearse("network firewall load");
    ASSERT_FALSE(load.empty());
    EXPECT_TRUE(Has(load[0], "kernel: nftables replace table inet hadro (input policy drop; ")) << load[0];
    EXPECT_TRUE(Has(load[0], std::string(")") + kOwn)) << load[0];
    ASSERT_EQ(Hadro("network firewall load").status, 0);
    ASSERT_EQ(Hadro("network firewall ruleset set -r webAccess -a false -e true").status, 0);
    auto allowed = Rehearse("network firewall ruleset allowedip add -r webAccess -i 192.0.2.9");
    ASSERT_FALSE(allowed.empty());
    EXPECT_TRUE(Has(allowed[0], "192.0.2.9")) << allowed[0];
    auto disabled = Rehearse("network firewall set -e false");
    ASSERT_FALSE(disabled.empty());
    EXPECT_TRUE(Has(disabled[0], "(input accepts everything")) << disabled[0];

    auto policy =
        Rehearse("network ip ipsec sp add -n web -s any -d 2001:db8::/64 -p 0 -P 443 -u tcp -A discard");
    ASSERT_FALSE(policy.empty());
    EXPECT_EQ(policy[0],
              std::string("kernel: xfrm policy add src ::/0 dst 2001:db8::/64 proto tcp dport 443 dir "
                          "out action block") +
                  kOwn);
}

TEST_F(DryRunTest, RefusalsPrivilegesAndBatchesEndAsTheRealRunWould) {
    // The host's refusal: the same message and exit status as the real run's, nothing changed.
    const std::string before = Host();
    auto dry = Hadro("--dry-run network vswitch standard uplink add -v vs1 -u a0");
    EXPECT_EQ(dry.status, 1);
    EXPECT_EQ(Host(), before);
    auto real = Hadro("network vswitch standard uplink add -v vs1 -u a0");
    EXPECT_EQ(real.status, 1);
    EXPECT_EQ(dry.err, real.err);

    // A change needs root in a dry run too: the real run would be refused.
    auto unprivileged = HadroUnprivileged("--dry-run network ip dns server add -s 10.1.1.1");
    EXPECT_EQ(unprivileged.status, 1);
    EXPECT_EQ(unprivileged.err, "Changing the host's network needs root (CAP_NET_ADMIN)\n");
    EXPECT_EQ(KernelLines(unprivileged.out), std::vector<std::string>());
    EXPECT_EQ(HadroUnprivileged("--dry-run network ip dns server list").status, 0);

    // A batch: each line sees what the lines before it would have made.
    std::ofstream(dir_ + "/batch") << "network vswitch standard add -v vs4\n"
                                      "network vswitch standard portgroup add -v vs4 -p pg4\n"
                                      "network vswitch standard uplink add -v vs4 -u e2\n";
    auto batch = Hadro("--dry-run --batch " + dir_ + "/batch");
    EXPECT_EQ(batch.status, 0) << batch.All();
    EXPECT_TRUE(Has(batch.out, std::string("kernel: link set e2 master vs4") + kOwn)) << batch.out;
    EXPECT_EQ(Host(), before);
}

}  // namespace

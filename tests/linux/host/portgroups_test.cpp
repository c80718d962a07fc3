// Port groups of the Linux host: names and VLAN IDs in the host's document, the bridge ports
// connected to them (the bridge ends of interfaces), VLAN IDs refused where the kernel has no
// bridge VLAN filtering. The bridge ends are connected here as the interfaces area connects
// them, through the area itself.
#include <fstream>
#include <sstream>

#include "core/config.h"
#include "core/context.h"
#include "hostctl/exception.h"
#include "kernel/netlink.h"
#include "namespace_host.h"
#include "network/vswitch.h"

namespace {

using nlohmann::json;

class PortGroupsTest : public Hadro::Test::NamespaceHostTest {
protected:
    void SetUp() override {
        NamespaceHostTest::SetUp();
        if (IsSkipped() || dir_.empty()) return;
        // This process is in the test's namespace now: sockets of an earlier one are stale.
        TknCtl::Linux::Kernel::ForgetSockets(TknCtl::Linux::Kernel::Namespace::Own());
        Configure("nics = e?\n");
        Sh("ip link add e1 type veth peer name e1-peer && ip link add vp0 type veth peer name tkn0");
        Hadro("network vswitch standard add -v vs1");
        Hadro("network vswitch standard add -v vs2");
    }
    void ExpectRefused(const std::string& arguments, const std::string& message) {
        auto result = Hadro(arguments);
        EXPECT_EQ(result.status, 1) << arguments << "\n" << result.All();
        EXPECT_EQ(result.err, message + "\n") << arguments;
    }
    // What the interfaces area does with an interface's bridge end, in one session.
    template <class Fn>
    void AsTheInterfacesArea(Fn fn) {
        TknCtl::Linux::Context context(TknCtl::Linux::Config::Load());
        TknCtl::Linux::LinuxSwitches switches(context);
        fn(switches);
        context.Commit();
    }
};

TEST_F(PortGroupsTest, PortGroupsAreListedAddedAndRemoved) {
    EXPECT_EQ(HadroJson("network vswitch standard portgroup list"), json::array());
    EXPECT_EQ(Hadro("network vswitch standard portgroup add -v vs1 -p 'VM Network'").status, 0);
    EXPECT_EQ(Hadro("network vswitch standard portgroup add -v vs2 -p Storage").status, 0);
    EXPECT_EQ(HadroJson("network vswitch standard portgroup list"), json::parse(R"([
        {"Name":"VM Network","Virtual Switch":"vs1","Active Clients":0,"VLAN ID":0},
        {"Name":"Storage","Virtual Switch":"vs2","Active Clients":0,"VLAN ID":0}])"));
    EXPECT_EQ(HadroJson("network vswitch standard list -v vs1")[0]["Portgroups"],
              json::array({"VM Network"}));
    ExpectRefused(
        "network vswitch standard portgroup add -v vs2 -p 'VM Network'",
        "Unable to add port group VM Network: virtual switch vs1 already has a port group of that name");
    ExpectRefused(
        "network vswitch standard portgroup remove -v vs2 -p 'VM Network'",
        "Unable to remove port group VM Network from virtual switch vs2: the switch has no such port group");
    ExpectRefused("network vswitch standard portgroup add -v nowhere -p x",
                  "Virtual switch nowhere does not exist");
    EXPECT_EQ(Hadro("network vswitch standard portgroup remove -v vs1 -p 'VM Network'").status, 0);
    EXPECT_EQ(HadroJson("network vswitch standard portgroup list").size(), 1u);
    // A switch that goes takes its port groups with it.
    EXPECT_EQ(Hadro("network vswitch standard remove -v vs2").status, 0);
    EXPECT_EQ(HadroJson("network vswitch standard portgroup list"), json::array());
}

TEST_F(PortGroupsTest, AVlanIdNeedsVlanFilteringWhichThisKernelLacks) {
    Hadro("network vswitch standard portgroup add -v vs1 -p pg");
    EXPECT_EQ(Hadro("network vswitch standard portgroup set -p pg -v 4095").status, 0);
    EXPECT_EQ(HadroJson("network vswitch standard portgroup list")[0]["VLAN ID"], 4095);
    ExpectRefused(
        "network vswitch standard portgroup set -p pg -v 10",
        "Unable to set the VLAN ID of port group pg to 10: a VLAN ID needs bridge VLAN filtering, which "
        "this kernel does not have (CONFIG_BRIDGE_VLAN_FILTERING)");
    EXPECT_EQ(HadroJson("network vswitch standard portgroup list")[0]["VLAN ID"], 4095);
    EXPECT_EQ(Hadro("network vswitch standard portgroup set -p pg -v 0").status, 0);
    EXPECT_EQ(ShJson("ip -j -d link show vs1")[0]["linkinfo"]["info_data"]["vlan_filtering"], 0);
    ExpectRefused("network vswitch standard portgroup set -p nowhere -v 0",
                  "Unable to find a port group with the name nowhere");
    auto unprivileged = HadroUnprivileged("network vswitch standard portgroup set -p pg -v 4095");
    EXPECT_EQ(unprivileged.err, "Changing the host's network needs root (CAP_NET_ADMIN)\n");
}

TEST_F(PortGroupsTest, AConnectedBridgeEndTakesThePortGroupsPoliciesAndHoldsIt) {
    Hadro("network vswitch standard portgroup add -v vs1 -p pg");
    Hadro("network vswitch standard portgroup policy shaping set -p pg -e true -b 2000 -k 2000 -t 100");
    Hadro("network vswitch standard portgroup policy security set -p pg -m true");
    AsTheInterfacesArea([](auto& switches) { switches.ConnectPort("pg", "vp0"); });
    auto vp0 = ShJson("bridge -d -j link show dev vp0")[0];
    EXPECT_EQ(vp0["master"], "vs1");
    EXPECT_EQ(vp0["learning"], true);
    EXPECT_EQ(vp0["flood"], false);
    EXPECT_EQ(vp0["locked"], true);
    const std::string mac = ShJson("ip -j link show tkn0")[0]["address"];
    EXPECT_NE(Sh("bridge fdb show dev vp0").find(mac + " master vs1 static"), std::string::npos);
    auto bucket = ShJson("tc -j qdisc show dev vp0")[0];
    EXPECT_EQ(bucket["kind"], "tbf");
    EXPECT_EQ(bucket["options"]["rate"], 250000);
    EXPECT_EQ(HadroJson("network vswitch standard portgroup list")[0]["Active Clients"], 1);

    ExpectRefused("network vswitch standard portgroup remove -v vs1 -p pg",
                  "Unable to remove port group pg from virtual switch vs1: port vp0 is connected to it");
    ExpectRefused("network vswitch standard remove -v vs1",
                  "Unable to remove virtual switch vs1: port vp0 (veth) is connected to it");

    AsTheInterfacesArea([](auto& switches) { switches.DisconnectPort("vp0"); });
    EXPECT_FALSE(ShJson("ip -j link show vp0")[0].contains("master"));
    EXPECT_NE(ShJson("tc -j qdisc show dev vp0")[0]["kind"], "tbf");
    EXPECT_EQ(HadroJson("network vswitch standard portgroup list")[0]["Active Clients"], 0);
    EXPECT_EQ(Hadro("network vswitch standard portgroup remove -v vs1 -p pg").status, 0);
}

TEST_F(PortGroupsTest, APortTheHostCannotConnectIsRefusedAndLeftAlone) {
    Hadro("network vswitch standard portgroup add -v vs1 -p pg");
    Sh("ip tuntap add tap9 mode tap && ip link add br9 type bridge && ip link add vp9 type veth peer name x9"
       " && ip link set vp9 master br9");
    auto refusal = [&](const std::string& port) {
        try {
            AsTheInterfacesArea([&](auto& switches) { switches.ConnectPort("pg", port); });
        } catch (const HostCtl::Lib::HostCtlException& e) {
            return std::string(e.what());
        }
        return std::string("connected");
    };
    EXPECT_EQ(refusal("e1"), "Unable to connect e1 to port group pg: it is no interface's end");
    EXPECT_EQ(refusal("nothing0"),
              "Unable to connect nothing0 to port group pg: the host has no network device of "
              "that name");
    EXPECT_EQ(refusal("vp9"), "Unable to connect vp9 to port group pg: it is a port of br9");
    // The port group's security (its switch's defaults) refuses MAC changes: a tap's client
    // address is unknown.
    EXPECT_EQ(refusal("tap9"),
              "Unable to carry out the security policy of port group pg on port tap9: it is no interface's "
              "veth end, so the address of its client is unknown to the host: refusing MAC changes or forged "
              "transmits needs it");
    EXPECT_FALSE(ShJson("ip -j link show tap9")[0].contains("master"));
    EXPECT_EQ(refusal("vp0"), "connected");
}

}  // namespace

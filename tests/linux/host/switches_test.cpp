// Standard switches of the Linux host: the bridges of the default netstack, their uplinks (NICs
// among their ports), MTU, and what the host's document keeps of them. `ip -j -d link` is the
// oracle.
#include <fstream>
#include <sstream>

#include "namespace_host.h"

namespace {

using Hadro::Test::Has;
using Hadro::Test::Slurp;

using nlohmann::json;

class SwitchesTest : public Hadro::Test::NamespaceHostTest {
protected:
    void SetUp() override {
        NamespaceHostTest::SetUp();
        if (IsSkipped() || dir_.empty()) return;
        // Three "NICs" named by the configuration; v9 is no NIC.
        Configure("nics = e?\n");
        Sh("for n in e1 e2 e3 v9; do ip link add $n type veth peer name $n-peer; done");
    }
    json Link(const std::string& name) { return ShJson("ip -j -d link show " + name)[0]; }
    json Switch(const std::string& name) {
        auto list = HadroJson("network vswitch standard list -v " + name);
        return list.size() == 1 ? list[0] : json();
    }
    void ExpectRefused(const std::string& arguments, const std::string& message) {
        auto result = Hadro(arguments);
        EXPECT_EQ(result.status, 1) << arguments << "\n" << result.All();
        EXPECT_EQ(result.err, message + "\n") << arguments;
    }
};

TEST_F(SwitchesTest, EveryBridgeOfTheDefaultNetstackIsASwitchWithItsNicsAsUplinks) {
    Sh("ip link add br0 type bridge && ip link set br0 mtu 1400 && ip link set e1 master br0"
       " && ip link add vp0 type veth peer name tkn0 && ip link set vp0 master br0");
    // A bridge inside another netstack is that netstack's own.
    Sh("ip netns add blue && ip netns exec blue ip link add hidden0 type bridge");
    auto list = HadroJson("network vswitch standard list");
    EXPECT_EQ(list, json::parse(R"([{"Name":"br0","Class":"bridge","Num Ports":128,"Used Ports":2,
        "Configured Ports":128,"MTU":1400,"CDP Status":"listen","Beacon Enabled":false,"Beacon Interval":1,
        "Beacon Threshold":3,"Beacon Required By":[],"Uplinks":["e1"],"Portgroups":[]}])"));
    EXPECT_EQ(Link("br0")["mtu"], 1400);
    auto unknown = Hadro("network vswitch standard list -v hidden0");
    EXPECT_EQ(unknown.err, "Unable to access all portsets\n");
    // A read needs no privilege.
    EXPECT_EQ(json::parse(HadroUnprivileged("--formatter=json network vswitch standard list").out), list);
}

TEST_F(SwitchesTest, AddMakesABridgeAndRemoveDeletesIt) {
    EXPECT_EQ(Hadro("network vswitch standard add -v vs1 -P 64").status, 0);
    auto link = Link("vs1");
    EXPECT_EQ(link["linkinfo"]["info_kind"], "bridge");
    EXPECT_EQ(link["mtu"], 1500);
    EXPECT_NE(link["flags"].dump().find("\"UP\""), std::string::npos) << link["flags"];
    EXPECT_EQ(Switch("vs1")["Num Ports"], 64);
    EXPECT_EQ(json::parse(Slurp(document_))["vswitches"]["vs1"]["ports"], 64);

    ExpectRefused("network vswitch standard add -v vs1",
                  "Unable to create virtual switch vs1: a virtual switch of that name exists");
    EXPECT_EQ(Hadro("network vswitch standard remove -v vs1").status, 0);
    EXPECT_NE(Try("ip link show vs1").status, 0);
    EXPECT_EQ(json::parse(Slurp(document_))["vswitches"], json::object());
    ExpectRefused("network vswitch standard remove -v vs1",
                  "Unable to find virtual switch with the name vs1");
}

TEST_F(SwitchesTest, WhatABridgeCannotBeIsRefusedAndNothingIsMade) {
    ExpectRefused(
        "network vswitch standard add -v vSwitch-too-long",
        "Unable to create virtual switch vSwitch-too-long: a bridge's name has at most 15 characters "
        "(the kernel's IFNAMSIZ)");
    ExpectRefused("network vswitch standard add -v vs1 -P 2048",
                  "Unable to create virtual switch vs1: a bridge has at most 1024 ports (the kernel's "
                  "BR_MAX_PORTS), not 2048");
    ExpectRefused("network vswitch standard add -v v9",
                  "Unable to create virtual switch v9: the host has a network device of that name (veth)");
    // The host's ports are shared by its switches.
    for (const char* name : {"vs1", "vs2", "vs3", "vs4"})
        EXPECT_EQ(Hadro(std::string("network vswitch standard add -P 1024 -v ") + name).status, 0);
    ExpectRefused(
        "network vswitch standard add -v vs5 -P 1024",
        "Unable to create virtual switch vs5: 1024 ports requested, but only 512 of the host's 4608 ports "
        "are left");
    // A switch has no more ports than it was given.
    Hadro("network vswitch standard add -v tiny -P 1");
    Sh("ip link add vp0 type veth peer name tkn0 && ip link set vp0 master tiny");
    ExpectRefused("network vswitch standard uplink add -v tiny -u e1",
                  "Unable to add uplink e1 to virtual switch tiny: the switch has no free port");
    Sh("ip link del vp0");
    for (const char* name : {"vs1", "vs2", "vs3", "vs4", "tiny"})
        Hadro(std::string("network vswitch standard remove -v ") + name);
    auto unprivileged = HadroUnprivileged("network vswitch standard add -v vs1");
    EXPECT_EQ(unprivileged.status, 1);
    EXPECT_EQ(unprivileged.err, "Changing the host's network needs root (CAP_NET_ADMIN)\n");
    EXPECT_EQ(ShJson("ip -j link show type bridge"), json::array());
}

TEST_F(SwitchesTest, AnUplinkIsANicPortOfTheBridgeWithTheSwitchsMtu) {
    Hadro("network vswitch standard add -v vs1");
    EXPECT_EQ(Hadro("network vswitch standard set -v vs1 -m 9000 -c both").status, 0);
    EXPECT_EQ(Hadro("network vswitch standard uplink add -v vs1 -u e1").status, 0);
    auto e1 = Link("e1");
    EXPECT_EQ(e1["master"], "vs1");
    EXPECT_EQ(e1["mtu"], 9000);
    auto vs1 = Switch("vs1");
    EXPECT_EQ(vs1["Uplinks"], json::array({"e1"}));
    EXPECT_EQ(vs1["MTU"], 9000);
    EXPECT_EQ(vs1["CDP Status"], "both");
    EXPECT_EQ(vs1["Used Ports"], 1);

    // The switch's MTU is the bridge's and its uplinks'.
    EXPECT_EQ(Hadro("network vswitch standard set -v vs1 -m 1500").status, 0);
    EXPECT_EQ(Link("vs1")["mtu"], 1500);
    EXPECT_EQ(Link("e1")["mtu"], 1500);
    ExpectRefused("network vswitch standard set -v vs1 -m 100",
                  "Unable to set the MTU of virtual switch vs1: the MTU must be between 1280 and 9000");

    EXPECT_EQ(Hadro("network vswitch standard uplink remove -v vs1 -u e1").status, 0);
    EXPECT_FALSE(Link("e1").contains("master"));
    EXPECT_EQ(Switch("vs1")["Uplinks"], json::array());
    ExpectRefused("network vswitch standard uplink remove -v vs1 -u e1",
                  "Unable to remove uplink e1 from virtual switch vs1: the switch has no such uplink");
}

TEST_F(SwitchesTest, AnUplinkThatIsNotTheHostsToGiveIsRefused) {
    Hadro("network vswitch standard add -v vs1");
    Sh("ip link add br0 type bridge && ip link set e2 master br0");
    ExpectRefused("network vswitch standard uplink add -v vs1 -u v9",
                  "Unable to add uplink v9 to virtual switch vs1: the host has no physical NIC of that name");
    ExpectRefused("network vswitch standard uplink add -v vs1 -u e2",
                  "Unable to add uplink e2 to virtual switch vs1: it is an uplink of virtual switch br0");
    Sh("ip link add mv0 link e1 type macvlan");
    ExpectRefused(
        "network vswitch standard uplink add -v vs1 -u e1",
        "Unable to add uplink e1 to virtual switch vs1: it carries macvlan device mv0, which takes its "
        "frames before a bridge could");
    Sh("ip addr add 192.0.2.7/24 dev e3");
    ExpectRefused(
        "network vswitch standard uplink add -v vs1 -u e3",
        "Unable to add uplink e3 to virtual switch vs1: e3 holds the address 192.0.2.7/24: a bridge port "
        "carries no IP configuration of its own; remove it first");
    Sh("ip addr add 2001:db8::7/64 dev e3 nodad");
    ExpectRefused("network vswitch standard uplink add -v vs1 -u e3",
                  "Unable to add uplink e3 to virtual switch vs1: e3 holds the addresses 192.0.2.7/24, "
                  "2001:db8::7/64: a bridge port carries no IP configuration of its own; remove them first");
    // The link-local address the kernel gives a NIC that comes up is no configuration.
    Sh("ip addr flush dev e3 && ip link set e3 up && ip link set e3-peer up");
    EXPECT_NE(Sh("ip -6 addr show dev e3").find("fe80::"), std::string::npos);
    EXPECT_EQ(Hadro("network vswitch standard uplink add -v vs1 -u e3").status, 0);
    ExpectRefused("network vswitch standard uplink add -v vs1 -u e3",
                  "Unable to add uplink e3 to virtual switch vs1: the switch already has it");
    Sh("ip link set e2 nomaster");
    ExpectRefused(
        "network vswitch standard uplink add -v vs1 -u e2",
        "Unable to add uplink e2 to virtual switch vs1: it would be a second uplink beside e3: a bridge "
        "forwards on every uplink it has, and more than one needs the bonding driver, which this kernel "
        "does not have (CONFIG_BONDING)");
    EXPECT_FALSE(Link("e2").contains("master"));
    auto unprivileged = HadroUnprivileged("network vswitch standard uplink remove -v vs1 -u e3");
    EXPECT_EQ(unprivileged.err, "Changing the host's network needs root (CAP_NET_ADMIN)\n");
    EXPECT_EQ(Link("e3")["master"], "vs1");
}

TEST_F(SwitchesTest, ASwitchInUseIsNotRemovedAndAFreeOneGivesItsUplinksBack) {
    Hadro("network vswitch standard add -v vs1");
    Hadro("network vswitch standard uplink add -v vs1 -u e1");
    Sh("ip link add vp0 type veth peer name tkn0 && ip link set vp0 master vs1");
    ExpectRefused("network vswitch standard remove -v vs1",
                  "Unable to remove virtual switch vs1: port vp0 (veth) is connected to it");
    Sh("ip link set vp0 nomaster && ip addr add 198.51.100.1/24 dev vs1");
    ExpectRefused(
        "network vswitch standard remove -v vs1",
        "Unable to remove virtual switch vs1: its bridge carries the host's address 198.51.100.1/24");
    Sh("ip addr flush dev vs1");
    Hadro("network vswitch standard policy shaping set -v vs1 -e true -b 1000 -k 1000 -t 100");
    EXPECT_EQ(ShJson("tc -j qdisc show dev e1")[0]["kind"], "tbf");
    EXPECT_EQ(Hadro("network vswitch standard remove -v vs1").status, 0);
    EXPECT_FALSE(Link("e1").contains("master"));
    EXPECT_EQ(Sh("tc qdisc show dev e1").find("tbf"), std::string::npos);
}

TEST_F(SwitchesTest, ADamagedDocumentIsRefusedAndKept) {
    Sh("ip link add br0 type bridge");
    const std::string damaged = R"({"version":1,"vswitches":{"br0":{"ports":"many"}}})";
    std::ofstream(document_) << damaged;
    auto result = Hadro("network vswitch standard list");
    EXPECT_EQ(result.status, 3);
    EXPECT_NE(result.err.find("member 'ports' is unknown or of the wrong type"), std::string::npos)
        << result.err;
    EXPECT_EQ(Slurp(document_), damaged);
}

}  // namespace

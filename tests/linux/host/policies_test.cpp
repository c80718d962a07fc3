// Policies of the Linux host's switches and port groups: security as bridge port flags with the
// client's address as a static forwarding entry, shaping as root token buckets on every port
// (those added later included), failover kept in the document with one active uplink.
// `bridge -d -j link`, `bridge fdb` and `tc -j qdisc` are the oracle.
#include <fstream>
#include <sstream>

#include "namespace_host.h"

namespace {

using Hadro::Test::Has;
using Hadro::Test::Slurp;

using nlohmann::json;

class PoliciesTest : public Hadro::Test::NamespaceHostTest {
protected:
    void SetUp() override {
        NamespaceHostTest::SetUp();
        if (IsSkipped() || dir_.empty()) return;
        Configure("nics = e?\n");
        Sh("ip link add e1 type veth peer name e1-peer && ip link add e2 type veth peer name e2-peer");
        Hadro("network vswitch standard add -v vs1");
        // Two bridge ends of interfaces: one whose interface is in this netstack, one whose is in
        // netstack blue.
        Sh("ip link add vp0 type veth peer name tkn0 && ip link set vp0 master vs1");
        Sh("ip netns add blue && ip link add vp1 type veth peer name tkn1 netns blue && ip link set vp1 "
           "master vs1");
    }
    // The flags of a port: learning, flood, locked.
    std::string Flags(const std::string& port) {
        auto link = ShJson("bridge -d -j link show dev " + port)[0];
        auto on = [&](const char* key) {
            return link[key].get<bool>() ? std::string("on") : std::string("off");
        };
        return on("learning") + " " + on("flood") + " " + on("locked");
    }
    // The root discipline of a port; a port that is down has none.
    json Root(const std::string& port) {
        auto roots = ShJson("tc -j qdisc show dev " + port);
        return roots.empty() ? json::parse(R"({"kind":"none"})") : roots[0];
    }
    void ExpectRefused(const std::string& arguments, const std::string& message) {
        auto result = Hadro(arguments);
        EXPECT_EQ(result.status, 1) << arguments << "\n" << result.All();
        EXPECT_EQ(result.err, message + "\n") << arguments;
    }
    // Connects a bridge end to a port group, as the interfaces area keeps it.
    void Connect(const std::string& group, const std::string& port) {
        auto document = json::parse(Slurp(document_));
        for (auto& entry : document["vswitches"]["vs1"]["portGroups"]) {
            if (entry["name"] == group) entry["ports"].push_back(port);
        }
        std::ofstream(document_) << document.dump();
    }
};

TEST_F(PoliciesTest, SecurityRefusalsAreBridgePortFlagsAndTheClientsAddress) {
    EXPECT_EQ(Flags("vp0"), "on on off");  // the bridge's defaults
    EXPECT_EQ(Hadro("network vswitch standard policy security set -v vs1 -m false").status, 0);
    EXPECT_EQ(Flags("vp0"), "off off on");
    EXPECT_EQ(Flags("vp1"), "off off on");
    const std::string here = ShJson("ip -j link show tkn0")[0]["address"];
    const std::string blue = ShJson("ip netns exec blue ip -j link show tkn1")[0]["address"];
    EXPECT_NE(Sh("bridge fdb show dev vp0").find(here + " master vs1 static"), std::string::npos);
    EXPECT_NE(Sh("bridge fdb show dev vp1").find(blue + " master vs1 static"), std::string::npos);

    EXPECT_EQ(Hadro("network vswitch standard policy security set -v vs1 -m true -f true").status, 0);
    EXPECT_EQ(Flags("vp0"), "on off off");
    EXPECT_EQ(
        HadroJson("network vswitch standard policy security get -v vs1"),
        json::parse(
            R"({"Allow Promiscuous":false,"Allow MAC Address Change":true,"Allow Forged Transmits":true})"));
    ExpectRefused(
        "network vswitch standard policy security set -v vs1 -p true",
        "Unable to update the security policy of virtual switch vs1: promiscuous mode cannot be allowed on "
        "a Linux bridge: it gives a port the frames addressed to the port and those it floods, never the "
        "frames it forwards to other ports");
    // An uplink carries every station's frames: it keeps the bridge's defaults.
    Hadro("network vswitch standard uplink add -v vs1 -u e1");
    Hadro("network vswitch standard policy security set -v vs1 -m false -f false");
    EXPECT_EQ(Flags("e1"), "on on off");
}

TEST_F(PoliciesTest, APortWhoseClientIsUnknownCannotBeRestricted) {
    Sh("ip tuntap add tap9 mode tap && ip link set tap9 master vs1");
    ExpectRefused(
        "network vswitch standard policy security set -v vs1 -f false",
        "Unable to carry out the security policy of virtual switch vs1 on port tap9: it is no interface's "
        "veth end, so the address of its client is unknown to the host: refusing MAC changes or forged "
        "transmits needs it");
    // Judged before anything changes.
    EXPECT_EQ(Flags("vp0"), "on on off");
    EXPECT_EQ(Hadro("network vswitch standard policy security set -v vs1 -m true -f true").status, 0);
    EXPECT_EQ(Flags("tap9"), "on off off");
}

TEST_F(PoliciesTest, APortGroupOverridesItsSwitchOnItsOwnPorts) {
    Hadro("network vswitch standard policy security set -v vs1 -m true -f true");
    Hadro("network vswitch standard portgroup add -v vs1 -p pg");
    Connect("pg", "vp0");
    EXPECT_EQ(Hadro("network vswitch standard portgroup policy security set -p pg -f false").status, 0);
    EXPECT_EQ(Flags("vp0"), "on off on");
    EXPECT_EQ(Flags("vp1"), "on off off");
    EXPECT_EQ(HadroJson("network vswitch standard portgroup policy security get -p pg"), json::parse(R"({
        "Allow Promiscuous":false,"Allow MAC Address Change":true,"Allow Forged Transmits":false,
        "Override Vswitch Allow Promiscuous":false,"Override Vswitch Allow MAC Address Change":false,
        "Override Vswitch Allow Forged Transmits":true})"));
    ExpectRefused(
        "network vswitch standard portgroup policy security set -p pg -o true",
        "Unable to update the security policy of port group pg: promiscuous mode cannot be allowed on a "
        "Linux bridge: it gives a port the frames addressed to the port and those it floods, never the "
        "frames it forwards to other ports");
    EXPECT_EQ(Hadro("network vswitch standard portgroup policy security set -p pg -u").status, 0);
    EXPECT_EQ(Flags("vp0"), "on off off");

    Hadro("network vswitch standard policy shaping set -v vs1 -e true -b 1000 -k 1000 -t 100");
    EXPECT_EQ(Hadro("network vswitch standard portgroup policy shaping set -p pg -e false").status, 0);
    EXPECT_NE(Root("vp0")["kind"], "tbf");
    EXPECT_EQ(Root("vp1")["kind"], "tbf");
}

TEST_F(PoliciesTest, ShapingIsATokenBucketOnEveryPortAndOnPortsAddedLater) {
    EXPECT_EQ(
        Hadro("network vswitch standard policy shaping set -v vs1 -e true -b 1000 -k 2000 -t 100").status, 0);
    for (const char* port : {"vp0", "vp1"}) {
        auto root = Root(port);
        EXPECT_EQ(root["kind"], "tbf") << port;
        EXPECT_EQ(root["options"]["rate"], 125000) << port;
        EXPECT_EQ(root["options"]["burst"], 12800) << port;
    }
    EXPECT_NE(Sh("tc qdisc show dev vp0").find("peakrate 2Mbit"), std::string::npos);
    EXPECT_EQ(
        HadroJson("network vswitch standard policy shaping get -v vs1"),
        json::parse(R"({"Enabled":true,"Average Bandwidth":1000,"Peak Bandwidth":2000,"Burst Size":100})"));
    Hadro("network vswitch standard uplink add -v vs1 -u e1");
    EXPECT_EQ(Root("e1")["kind"], "tbf");
    EXPECT_EQ(Root("e1")["options"]["rate"], 125000);

    EXPECT_EQ(Hadro("network vswitch standard policy shaping set -v vs1 -e false").status, 0);
    for (const char* port : {"vp0", "vp1", "e1"})
        EXPECT_NE(Root(port)["kind"], "tbf") << port;
    EXPECT_EQ(HadroJson("network vswitch standard policy shaping get -v vs1")["Average Bandwidth"], -1);
}

TEST_F(PoliciesTest, ShapingATokenBucketCannotDoIsRefusedAndChangesNothing) {
    ExpectRefused(
        "network vswitch standard policy shaping set -v vs1 -e true -b 2000 -k 1000 -t 100",
        "Unable to shape the traffic of port vp0 of virtual switch vs1: the peak bandwidth (1000 Kbps) is "
        "below the average bandwidth (2000 Kbps): a token bucket's peak rate cannot be below its average "
        "rate");
    ExpectRefused(
        "network vswitch standard policy shaping set -v vs1 -e true -b 1000 -k 1000 -t 1",
        "Unable to shape the traffic of port vp0 of virtual switch vs1: a burst of 128 bytes cannot pass a "
        "full frame of 1514 bytes (MTU 1500): every such frame would be dropped");
    Sh("tc qdisc add dev vp1 root handle 1: htb");
    ExpectRefused(
        "network vswitch standard policy shaping set -v vs1 -e true -b 1000 -k 1000 -t 100",
        "Unable to shape the traffic of port vp1 of virtual switch vs1: it has a queueing discipline of its "
        "own (htb); remove it first");
    EXPECT_EQ(Root("vp0")["kind"], "none");
    EXPECT_EQ(Root("vp1")["kind"], "htb");
    EXPECT_EQ(HadroJson("network vswitch standard policy shaping get -v vs1")["Enabled"], false);
}

TEST_F(PoliciesTest, ShapedUplinksFollowTheSwitchsMtuOrTheChangeIsRefused) {
    Hadro("network vswitch standard policy shaping set -v vs1 -e true -b 1000 -k 2000 -t 12");
    EXPECT_EQ(Hadro("network vswitch standard set -v vs1 -m 9000").status, 0);
    // A NIC that the switch's shaping cannot take at the switch's MTU is given back as it was.
    ExpectRefused(
        "network vswitch standard uplink add -v vs1 -u e1",
        "Unable to shape the traffic of port e1 of virtual switch vs1: a burst of 1536 bytes cannot pass a "
        "full frame of 9014 bytes (MTU 9000): every such frame would be dropped");
    auto e1 = ShJson("ip -j link show e1")[0];
    EXPECT_FALSE(e1.contains("master"));
    EXPECT_EQ(e1["mtu"], 1500);
    EXPECT_EQ(Root("e1")["kind"], "none");

    Hadro("network vswitch standard set -v vs1 -m 1500");
    Hadro("network vswitch standard uplink add -v vs1 -u e1");
    ExpectRefused(
        "network vswitch standard set -v vs1 -m 9000",
        "Unable to set the MTU of virtual switch vs1 to 9000: the shaping of uplink e1 could not follow: a "
        "burst of 1536 bytes cannot pass a full frame of 9014 bytes (MTU 9000): every such frame would be "
        "dropped");
    EXPECT_EQ(ShJson("ip -j link show e1")[0]["mtu"], 1500);
    Hadro("network vswitch standard policy shaping set -v vs1 -t 100");
    EXPECT_EQ(Hadro("network vswitch standard set -v vs1 -m 9000").status, 0);
    // The peak bucket holds the larger frames now.
    EXPECT_NE(Sh("tc qdisc show dev e1").find("minburst 9018b"), std::string::npos)
        << Sh("tc qdisc show dev e1");
}

TEST_F(PoliciesTest, FailoverIsKeptWithTheOneActiveUplinkABridgeHas) {
    Hadro("network vswitch standard uplink add -v vs1 -u e1");
    EXPECT_EQ(
        Hadro("network vswitch standard policy failover set -v vs1 -l mac -n false -b false -a e1").status,
        0);
    EXPECT_EQ(HadroJson("network vswitch standard policy failover get -v vs1"), json::parse(R"({
        "Load Balancing":"srcmac","Network Failure Detection":"link","Notify Switches":false,"Failback":false,
        "Active Adapters":["e1"],"Standby Adapters":[],"Unused Adapters":[]})"));
    EXPECT_EQ(json::parse(Slurp(document_))["vswitches"]["vs1"]["policy"]["teaming"],
              json::parse(R"({"loadBalancing":2,"notifySwitches":false,"rollingRestoration":true,
                              "linkCriteria":{"beacon":true},"uplinkOrder":["e1"],"maxActiveUplinks":1})"));
    ExpectRefused(
        "network vswitch standard policy failover set -v vs1 -f beacon",
        "Unable to update the teaming policy of virtual switch vs1: beacon probing is not available on a "
        "Linux host: a bridge knows an uplink's failure by its link state only");
    ExpectRefused(
        "network vswitch standard policy failover set -v vs1 -s e1",
        "Unable to update the teaming policy of virtual switch vs1: uplink e1 would be standby, but a "
        "bridge forwards on every uplink it has: keeping one out of service needs the bonding driver, "
        "which this kernel does not have (CONFIG_BONDING)");
    Hadro("network vswitch standard portgroup add -v vs1 -p pg");
    ExpectRefused("network vswitch standard portgroup policy failover set -p pg -s e1",
                  "Unable to update the teaming policy of port group pg: uplink e1 would be standby, but a "
                  "bridge forwards on every uplink it has: keeping one out of service needs the "
                  "bonding driver, which this kernel does not have (CONFIG_BONDING)");

    // An uplink that goes leaves the order; one that comes joins the actives.
    EXPECT_EQ(Hadro("network vswitch standard uplink remove -v vs1 -u e1").status, 0);
    EXPECT_EQ(Hadro("network vswitch standard uplink add -v vs1 -u e2").status, 0);
    auto failover = HadroJson("network vswitch standard policy failover get -v vs1");
    EXPECT_EQ(failover["Active Adapters"], json::array({"e2"}));
    EXPECT_EQ(failover["Load Balancing"], "srcmac");
}

TEST_F(PoliciesTest, AChangeOfAPolicyNeedsRoot) {
    for (const char* command : {"network vswitch standard policy security set -v vs1 -m true",
                                "network vswitch standard policy shaping set -v vs1 -e false",
                                "network vswitch standard policy failover set -v vs1 -n false"}) {
        auto result = HadroUnprivileged(command);
        EXPECT_EQ(result.status, 1) << command;
        EXPECT_EQ(result.err, "Changing the host's network needs root (CAP_NET_ADMIN)\n") << command;
    }
    EXPECT_EQ(
        HadroUnprivileged("--formatter=json network vswitch standard policy failover get -v vs1").status, 0);
}

}  // namespace

// Interfaces on port groups of the Linux host: "network ip interface add" and "remove" make
// and delete a veth pair whose named end lies in its netstack and whose bridge end is a port of
// the port group's bridge, checked against what ip, bridge and tc say.
#include <fstream>
#include <sstream>

#include "backend/interfaces.h"
#include "core/config.h"
#include "core/context.h"
#include "hostctl/exception.h"
#include "kernel/netlink.h"
#include "namespace_host.h"
#include "network/areas.h"

namespace {

using nlohmann::json;

std::string Slurp(const std::string& path) {
    std::ifstream in(path);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

json Record(const json& list, const std::string& name) {
    for (const auto& record : list) {
        if (record["Name"] == name) return record;
    }
    return json();
}

class AttachTest : public Hadro::Test::NamespaceHostTest {
protected:
    // Switch vs1 with uplink e1 and port groups pg, pg2 and pg3.
    void SetUp() override {
        NamespaceHostTest::SetUp();
        if (IsSkipped() || dir_.empty()) return;
        TknCtl::Linux::Kernel::ForgetSockets(TknCtl::Linux::Kernel::Namespace::Own());
        Configure("nics = e?\n");
        Sh("ip link add e1 type veth peer name e1-peer");
        for (const char* step :
             {"vswitch standard add -v vs1", "vswitch standard uplink add -v vs1 -u e1",
              "vswitch standard portgroup add -v vs1 -p pg", "vswitch standard portgroup add -v vs1 -p pg2",
              "vswitch standard portgroup add -v vs1 -p pg3"})
            ASSERT_EQ(Hadro(std::string("network ") + step).status, 0) << step;
    }
    // A command that ran: exit 0, nothing on stderr.
    ::testing::AssertionResult Ok(const std::string& arguments) {
        auto result = Hadro(arguments);
        if (result.status == 0 && result.err.empty()) return ::testing::AssertionSuccess();
        return ::testing::AssertionFailure() << arguments << ": exit " << result.status << "\n"
                                             << result.All();
    }
    void ExpectRefused(const std::string& arguments, const std::string& message) {
        auto result = Hadro(arguments);
        EXPECT_EQ(result.status, 1) << arguments << "\n" << result.All();
        EXPECT_EQ(result.err, message + "\n") << arguments;
    }
    json Link(const std::string& name, const std::string& netns = {}) {
        return ShJson((netns.empty() ? "ip" : "ip -n " + netns) + " -j -d link show " + name)[0];
    }
    bool Exists(const std::string& name, const std::string& netns = {}) {
        return Try((netns.empty() ? "ip" : "ip -n " + netns) + " link show " + name).status == 0;
    }
    // What a refusal must leave as it was: each device's name, peer, master, MTU and address.
    json Devices() {
        json out = json::array();
        for (const auto& link : ShJson("ip -j link show")) {
            out.push_back({link["ifname"], link.value("link", ""), link.value("master", ""), link["mtu"],
                           link["address"]});
        }
        return out;
    }
    json Document() { return json::parse(Slurp(document_)); }
    json PortGroupList() { return HadroJson("network vswitch standard portgroup list"); }
};

TEST_F(AttachTest, AnInterfaceIsAVethPairWhoseBridgeEndIsAPortOfThePortGroupsSwitch) {
    const std::string bridgeMac = Link("vs1")["address"];
    ASSERT_TRUE(Ok("network ip interface add -p pg -m 9000 -M 02:aa:bb:cc:dd:ee -R 4"));

    auto nic = Link("tkn0");
    EXPECT_EQ(nic["linkinfo"]["info_kind"], "veth");
    EXPECT_EQ(nic["link"], "tkn0-port");
    EXPECT_EQ(nic["mtu"], 9000);
    EXPECT_EQ(nic["address"], "02:aa:bb:cc:dd:ee");
    EXPECT_EQ(nic["num_rx_queues"], 4);
    EXPECT_EQ(nic["operstate"], "UP");
    auto end = Link("tkn0-port");
    EXPECT_EQ(end["master"], "vs1");
    // The switch's MTU and an address the bridge never takes for its own: the bridge keeps both.
    EXPECT_EQ(end["mtu"], 1500);
    EXPECT_EQ(end["address"].get<std::string>().substr(0, 3), "fe:");
    EXPECT_EQ(Link("vs1")["address"], bridgeMac);
    EXPECT_EQ(ShJson("bridge -j link show dev tkn0-port")[0]["state"], "forwarding");
    // The port group's security: the client's address alone passes.
    EXPECT_EQ(ShJson("bridge -d -j link show dev tkn0-port")[0]["locked"], true);
    EXPECT_NE(Sh("bridge fdb show dev tkn0-port").find("02:aa:bb:cc:dd:ee master vs1 static"),
              std::string::npos);

    auto list = HadroJson("network ip interface list");
    auto record = Record(list, "tkn0");
    EXPECT_EQ(record["Portset"], "vs1");
    EXPECT_EQ(record["Portgroup"], "pg");
    EXPECT_EQ(record["Netstack Instance"], "defaultTcpipStack");
    EXPECT_EQ(record["MAC Address"], "02:aa:bb:cc:dd:ee");
    EXPECT_EQ(record["MTU"], 9000);
    EXPECT_EQ(record["RXDispQueue Size"], 4);
    EXPECT_EQ(record["TSO MSS"], Link("tkn0")["gso_max_size"]);
    EXPECT_TRUE(Record(list, "tkn0-port").is_null());  // a bridge port carries no IP
    EXPECT_EQ(Record(PortGroupList(), "pg")["Active Clients"], 1);

    // Without a name the lowest free one; without a MAC address one of the kernel's.
    Sh("ip link add tkn1 type veth peer name x1");
    ASSERT_TRUE(Ok("network ip interface add -p pg2"));
    EXPECT_EQ(Link("tkn2")["mtu"], 1500);
    EXPECT_EQ(Record(HadroJson("network ip interface list"), "tkn2")["Portgroup"], "pg2");

    // The bridge end follows the switch's MTU, as the uplinks do.
    ASSERT_TRUE(Ok("network vswitch standard set -v vs1 -m 9000"));
    EXPECT_EQ(Link("tkn0-port")["mtu"], 9000);

    ASSERT_TRUE(Ok("network ip interface remove -i tkn0"));
    EXPECT_FALSE(Exists("tkn0"));
    EXPECT_FALSE(Exists("tkn0-port"));
    ASSERT_TRUE(Ok("network ip interface remove -p pg2"));
    EXPECT_FALSE(Exists("tkn2-port"));
    EXPECT_EQ(Record(PortGroupList(), "pg")["Active Clients"], 0);
    const json document = Document();
    for (const auto& group : document["vswitches"]["vs1"]["portGroups"])
        EXPECT_EQ(group["ports"], json::array()) << group;
    EXPECT_EQ(Link("vs1")["address"], bridgeMac);
}

TEST_F(AttachTest, OnADedicatedNetstackTheNamedEndLivesThereWithTheTagAndGoesWithItsRoutes) {
    ASSERT_TRUE(Ok("network ip interface add -p pg2"));
    ASSERT_TRUE(Ok("network ip interface tag add -i tkn0 -t Glidex"));
    // What the document still keeps of a device tkn1 that went is not the new tkn1's.
    Sh("ip link add tkn1 type veth peer name x1");
    ASSERT_TRUE(Ok("network ip interface tag add -i tkn1 -t Storage"));
    Sh("ip link del tkn1");
    ASSERT_TRUE(Ok("network ip interface add -p pg3"));
    EXPECT_EQ(HadroJson("network ip interface tag get -i tkn1")["Tags"], json::array());

    // The dedicated netstack is made, and its tag moves from the default netstack's interface.
    ASSERT_TRUE(Ok("network ip interface add -p pg -N glidex"));
    EXPECT_NE(Sh("ip netns list").find("glidex"), std::string::npos);
    auto nic = Link("tkn2", "glidex");
    EXPECT_EQ(nic["linkinfo"]["info_kind"], "veth");
    EXPECT_FALSE(Exists("tkn2"));
    auto end = Link("tkn2-port");
    EXPECT_EQ(end["master"], "vs1");
    EXPECT_EQ(end["ifindex"], nic["link_index"]);
    EXPECT_EQ(HadroJson("network ip interface tag get -i tkn2")["Tags"], json::array({"Glidex"}));
    EXPECT_EQ(HadroJson("network ip interface tag get -i tkn0")["Tags"], json::array());
    auto record = Record(HadroJson("network ip interface list -N glidex"), "tkn2");
    EXPECT_EQ(record["Portgroup"], "pg");
    EXPECT_EQ(record["Netstack Instance"], "glidex");

    // The kernel takes the routes and neighbours through the device with it.
    Sh("ip -n glidex addr add 10.9.0.2/24 dev tkn2 && ip -n glidex route add 10.10.0.0/16 via 10.9.0.1"
       " && ip -n glidex neigh add 10.9.0.1 lladdr 02:00:00:00:00:09 dev tkn2");
    ExpectRefused(
        "network ip interface remove -p pg",
        "Unable to remove Tarkon network interface. Error was : The Tarkon network interface at port "
        "group 'pg' (tkn2) belongs to netstack 'glidex', not 'defaultTcpipStack'");
    ASSERT_TRUE(Ok("network ip interface remove -p pg -N glidex"));
    EXPECT_FALSE(Exists("tkn2", "glidex"));
    EXPECT_FALSE(Exists("tkn2-port"));
    EXPECT_EQ(ShJson("ip -n glidex -j route show"), json::array());
    EXPECT_EQ(ShJson("ip -n glidex -j neigh show"), json::array());
    EXPECT_FALSE(Document()["interfaces"].contains("tags") &&
                 Document()["interfaces"]["tags"].contains("glidex"))
        << Document();
    EXPECT_EQ(HadroJson("network ip netstack list").size(), 2u);  // the netstack stays

    // No daemon is restarted on a Linux host: said, and the interface is made.
    auto provisioning = Hadro("network ip interface add -p pg -N PellixProvisioning");
    EXPECT_EQ(provisioning.status, 0);
    EXPECT_EQ(provisioning.err,
              "Warning: \"/etc/init.d/nfcd restart\" is not run: the Linux host has no such daemon, and "
              "runs no programs\n");
    EXPECT_TRUE(Exists("tkn2", "PellixProvisioning"));
}

TEST_F(AttachTest, AFailureHalfWayLeavesNothingBehind) {
    ASSERT_TRUE(Ok("network ip netstack add -N backup --disabled"));
    const json devices = Devices();
    const json before = Document();
    // A nics line that takes the bridge end for a physical NIC: the switch refuses to connect
    // it once the pair is made.
    Configure("nics = e? tkn*\n");
    const std::string refusal =
        "Unable to add Tarkon network interface. Error was : Unable to connect tkn0-port to port group pg: "
        "it "
        "is no interface's end";
    ExpectRefused("network ip interface add -p pg", refusal);
    ExpectRefused("network ip interface add -p pg -N glidex", refusal);
    ExpectRefused("network ip interface add -p pg -N backup", refusal);
    EXPECT_EQ(Devices(), devices);
    EXPECT_EQ(Sh("ip netns list"), "");
    auto after = Document();
    EXPECT_EQ(after["vswitches"], before["vswitches"]);
    EXPECT_EQ(after["netstacks"], before["netstacks"]);  // backup kept disabled, glidex not made
    EXPECT_FALSE(after.contains("interfaces") && !after["interfaces"].empty()) << after;
}

TEST_F(AttachTest, WhatTheHostRefusesChangesNothing) {
    ASSERT_TRUE(Ok("network ip interface add -p pg"));
    Sh("ip link add tkn3 type veth peer name tkp3");
    // A bridge port named like an interface, and a device named like a bridge end.
    Sh("ip link add br5 type bridge && ip link add tkn5 type veth peer name y5 && ip link set tkn5 master "
       "br5");
    Sh("ip link add tkn4-port type veth peer name y4");
    Sh("ip link add e2 type veth peer name e2-peer");
    ASSERT_TRUE(Ok("network vswitch standard add -v tiny -P 1"));
    ASSERT_TRUE(Ok("network vswitch standard uplink add -v tiny -u e2"));
    ASSERT_TRUE(Ok("network vswitch standard portgroup add -v tiny -p full"));
    const json devices = Devices();
    const std::string document = Slurp(document_);
    const std::string mac = Link("tkn0")["address"];
    const std::string uplinkMac = Link("e1")["address"];

    const std::string add = "Unable to add Tarkon network interface. Error was : ";
    const std::string remove = "Unable to remove Tarkon network interface. Error was : ";
    ExpectRefused("network ip interface add -p pg", add +
                                                        "The port group 'pg' already has a Tarkon network "
                                                        "interface (tkn0)");
    ExpectRefused("network ip interface add -p pg2 -i tkn0",
                  add + "A Tarkon network interface named tkn0 already exists");
    ExpectRefused("network ip interface add -p pg2 -i tkn3",
                  add + "A Tarkon network interface named tkn3 already exists");
    ExpectRefused("network ip interface add -p pg2 -i tkn5",
                  add + "Netstack 'defaultTcpipStack' has a network device named tkn5 already");
    ExpectRefused("network ip interface add -p pg2 -i tkn4",
                  add +
                      "The bridge end of tkn4 would be tkn4-port, the name of another network device of "
                      "netstack 'defaultTcpipStack'");
    ExpectRefused("network ip interface add -p pg2 -M " + mac,
                  add + "MAC address " + mac + " is already in use");
    ExpectRefused("network ip interface add -p pg2 -M " + uplinkMac,
                  add + "MAC address " + uplinkMac + " is already in use");
    ExpectRefused("network ip interface add -p pg2 -N nowhere",
                  add + "Netstack instance 'nowhere' does not exist");
    ExpectRefused("network ip interface add -p full",
                  add + "Virtual switch tiny has no free port (1 ports, all in use)");
    ExpectRefused("network ip interface add -p nowhere", "Invalid vswitch port group or DVPort parameters.");
    ExpectRefused("network ip interface remove -p nowhere",
                  "Invalid vswitch port group or DVPort parameters.");
    ExpectRefused("network ip interface remove -p pg2", remove +
                                                            "No Tarkon network interface is attached to port "
                                                            "group 'pg2'");
    ExpectRefused("network ip interface remove -i tkn3",
                  remove +
                      "Tarkon network interface tkn3 was not made on a port group: the Linux host removes "
                      "only the interfaces it made there (a veth pair whose other end, tkn3-port, is a port "
                      "of a standard switch)");
    for (const char* verb : {"add", "remove"}) {
        ExpectRefused(
            std::string("network ip interface ") + verb + " -s dvs1 -P 7",
            "Unable to retrieve DVS info by specified DVS name dvs1. Error was: Distributed switch dvs1 "
            "does not exist");
    }
    const std::string root = "Changing the host's network needs root (CAP_NET_ADMIN)";
    EXPECT_EQ(HadroUnprivileged("network ip interface add -p pg2").err, add + root + "\n");
    EXPECT_EQ(HadroUnprivileged("network ip interface add -p pg2 -N glidex").err, add + root + "\n");
    EXPECT_EQ(HadroUnprivileged("network ip interface remove -i tkn0").err, remove + root + "\n");
    EXPECT_EQ(HadroUnprivileged("network ip interface remove -p pg").err, remove + root + "\n");
    // A read needs no privilege.
    auto list = HadroUnprivileged("--formatter=json network ip interface list");
    EXPECT_EQ(list.status, 0) << list.err;
    EXPECT_EQ(Record(json::parse(list.out), "tkn0")["Portgroup"], "pg");

    EXPECT_EQ(Devices(), devices);
    EXPECT_EQ(Sh("ip netns list"), "");
    EXPECT_EQ(Slurp(document_), document);
}

// Connection points a Linux host does not have, as the library may hand them to it.
class Elsewhere : public HostCtl::Network::ConnectionPoint {
public:
    explicit Elsewhere(int type) : type_(type) {}
    std::string GetPortsetName() const override { return {}; }
    bool IsValid() const override { return true; }
    int GetConnectionType() const override { return type_; }
    std::string GetPortGroupName() const override { return {}; }
    HostCtl::Network::DVPortParam GetDVPortParam() const override { return {"uuid", "7", 0}; }
    HostCtl::Network::OpaqueNetworkParam GetOpaqueNetworkParam() const override {
        return {"net-1", "nsx", "x"};
    }

private:
    int type_;
};

TEST_F(AttachTest, DistributedPortsAndOpaqueNetworksAreRefusedSayingWhy) {
    TknCtl::Linux::Context context(TknCtl::Linux::Config::Load());
    auto area = TknCtl::Linux::MakeInterfaces(context);
    auto refusal = [&](int type, bool attach) {
        try {
            Elsewhere point(type);
            if (attach) {
                area->Add(point, "defaultTcpipStack", {}, 65535, 1500, 1, {});
            } else {
                area->AttachedAt(point);
            }
        } catch (const HostCtl::Lib::HostCtlException& e) {
            return std::string(e.what());
        }
        return std::string("not refused");
    };
    const std::string distributed =
        "Distributed port '7' cannot be a connection point: there is no distributed switch on a Linux host";
    const std::string opaque =
        "Opaque network 'net-1' cannot be a connection point: opaque networks belong to distributed "
        "switches, "
        "and there is no distributed switch on a Linux host";
    using HostCtl::Network::ConnectionPoint;
    EXPECT_EQ(refusal(ConnectionPoint::TYPE_DVPORT, false), distributed);
    EXPECT_EQ(refusal(ConnectionPoint::TYPE_DVPORT, true), distributed);
    EXPECT_EQ(refusal(ConnectionPoint::TYPE_OPAQUE_NETWORK, true), opaque);
    EXPECT_EQ(refusal(9, false), "Unknown connection point type 9");
    context.Discard();
    EXPECT_EQ(ShJson("ip -j link show").size(), 4u);  // lo, e1, e1-peer and vs1: nothing new
}

}  // namespace

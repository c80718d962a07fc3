// IP interfaces of the Linux host: "network ip interface ..." against what ip, sysctl and
// /proc say of the test's own namespaces.
#include <fstream>
#include <set>
#include <sstream>

#include "namespace_host.h"

namespace {

using Hadro::Test::Has;
using Hadro::Test::Slurp;

using nlohmann::json;

// The record of a listing whose field has the value.
json Record(const json& list, const std::string& field, const std::string& value) {
    for (const auto& record : list) {
        if (record.value(field, std::string()) == value) return record;
    }
    return json();
}

std::vector<std::string> Names(const json& list, const std::string& field = "Name") {
    std::vector<std::string> names;
    for (const auto& record : list)
        names.push_back(record[field]);
    return names;
}

class InterfacesTest : public Hadro::Test::NamespaceHostTest {
protected:
    // a0 (up, 10.1.0.1/24) and its peer a1; a bridge with one port; netstack glidex with g1.
    void Build() {
        // Addresses are usable at once: no duplicate address detection to wait for.
        Sh("echo 0 > /proc/sys/net/ipv6/conf/all/accept_dad && echo 0 > "
           "/proc/sys/net/ipv6/conf/default/accept_dad");
        Sh("ip link add a0 type veth peer name a1 && ip link set a0 up && ip link set a1 up"
           " && ip addr add 10.1.0.1/24 dev a0"
           " && ip link add br0 type bridge && ip link add p0 type veth peer name p1 && ip link set p1 "
           "master br0"
           " && ip netns add glidex && ip link add g0 type veth peer name g1 netns glidex");
    }
    json Link(const std::string& name, const std::string& netns = {}) {
        return ShJson((netns.empty() ? "ip" : "ip -n " + netns) + " -j -d link show " + name)[0];
    }
    std::string Sysctl(const std::string& name) { return Sh("cat /proc/sys/net/" + name); }
};

TEST_F(InterfacesTest, EveryNetstacksDevicesButBridgePortsAndTheLoopbackAreListedAsTheKernelHasThem) {
    Build();
    Sh("ip link set a0 mtu 9000");
    auto list = HadroJson("network ip interface list");
    EXPECT_EQ(Names(list), (std::vector<std::string>{"a1", "a0", "br0", "p0", "g0", "g1"}));
    for (const char* name : {"a0", "a1", "br0"}) {
        auto record = Record(list, "Name", name);
        auto link = Link(name);
        EXPECT_EQ(record["MAC Address"], link["address"]) << name;
        EXPECT_EQ(record["MTU"], link["mtu"]) << name;
        EXPECT_EQ(record["TSO MSS"], link["gso_max_size"]) << name;
        EXPECT_EQ(record["RXDispQueue Size"], link["num_rx_queues"]) << name;
        bool up = false;
        for (const auto& flag : link["flags"])
            up = up || flag == "UP";
        EXPECT_EQ(record["Enabled"], up) << name;
        // None of them was made on a port group: no connection point.
        EXPECT_EQ(record["Portgroup"], "N/A");
        EXPECT_EQ(record["QBR Connection"], -1);
    }
    EXPECT_EQ(Names(HadroJson("network ip interface list -N glidex")), (std::vector<std::string>{"g1"}));
    EXPECT_EQ(Record(HadroJson("network ip interface list -N glidex"), "Name", "g1")["MAC Address"],
              Link("g1", "glidex")["address"]);
    auto unknown = Hadro("network ip interface list -N nowhere");
    EXPECT_EQ(unknown.status, 1);
    EXPECT_TRUE(Has(unknown.err, "Netstack instance 'nowhere' does not exist")) << unknown.err;
}

TEST_F(InterfacesTest, EnabledAndMtuAreSetInTheKernelAndWhatTheHostRefusesChangesNothing) {
    Build();
    EXPECT_EQ(Hadro("network ip interface set -i br0 -e true -m 9000").status, 0);
    EXPECT_EQ(Link("br0")["mtu"], 9000);
    EXPECT_TRUE(Has(Link("br0")["flags"].dump(), "\"UP\""));
    EXPECT_EQ(Hadro("network ip interface set -i br0 -e false").status, 0);
    EXPECT_FALSE(Has(Link("br0")["flags"].dump(), "\"UP\""));

    auto small = Hadro("network ip interface set -i br0 -m 1000");
    EXPECT_EQ(small.status, 1);
    EXPECT_EQ(small.err, "Invalid MTU 1000: it must be between 1280 and 9000\n");
    auto negative = Hadro("network ip interface set -i br0 -m -1");
    EXPECT_EQ(negative.err, "MTU size should be a positive value\n");
    EXPECT_EQ(Link("br0")["mtu"], 9000);
    // A bridge port carries no IP: it is no interface of these commands.
    EXPECT_EQ(Hadro("network ip interface set -i p1 -e true").err,
              "Unable to find an interface with name p1\n");
    EXPECT_FALSE(Has(Link("p1")["flags"].dump(), "\"UP\""));
}

TEST_F(InterfacesTest, AStaticIpv4SettingLeavesTheInterfaceOneAddressAndItsGateway) {
    Build();
    Sh("ip addr add 10.1.0.7/24 dev a0 && ip addr add 10.9.0.1/16 dev a0");
    EXPECT_EQ(Hadro("network ip interface ipv4 set -i a0 -t static -I 10.2.0.5 -N 255.255.255.0 -g 10.2.0.1")
                  .status,
              0);
    auto addresses = ShJson("ip -j -4 addr show dev a0")[0]["addr_info"];
    ASSERT_EQ(addresses.size(), 1u) << addresses;
    EXPECT_EQ(addresses[0]["local"], "10.2.0.5");
    EXPECT_EQ(addresses[0]["prefixlen"], 24);
    EXPECT_EQ(addresses[0]["broadcast"], "10.2.0.255");
    auto fallback = ShJson("ip -j route show default");
    ASSERT_EQ(fallback.size(), 1u);
    EXPECT_EQ(fallback[0]["gateway"], "10.2.0.1");
    EXPECT_EQ(fallback[0]["dev"], "a0");

    auto record = HadroJson("network ip interface ipv4 get -i a0");
    ASSERT_EQ(record.size(), 1u);
    EXPECT_EQ(record[0]["IPv4 Address"], "10.2.0.5");
    EXPECT_EQ(record[0]["IPv4 Netmask"], "255.255.255.0");
    EXPECT_EQ(record[0]["IPv4 Broadcast"], "10.2.0.255");
    EXPECT_EQ(record[0]["Address Type"], "STATIC");
    EXPECT_EQ(record[0]["Gateway"], "10.2.0.1");
    EXPECT_EQ(HadroJson("network ip interface ipv4 address list"),
              HadroJson("network ip interface ipv4 get"));
    // Every netstack's interfaces, or one netstack's.
    EXPECT_EQ(Names(HadroJson("network ip interface ipv4 get")),
              (std::vector<std::string>{"a1", "a0", "br0", "p0", "g0", "g1"}));
    EXPECT_EQ(Names(HadroJson("network ip interface ipv4 get -N glidex")), (std::vector<std::string>{"g1"}));

    // The same setting again changes nothing; without a gateway the default route goes.
    EXPECT_EQ(Hadro("network ip interface ipv4 set -i a0 -t static -I 10.2.0.5 -N 255.255.255.0 -g 10.2.0.1")
                  .status,
              0);
    EXPECT_EQ(Hadro("network ip interface ipv4 set -i a0 -t static -I 10.2.0.5 -N 255.255.255.0").status, 0);
    EXPECT_TRUE(ShJson("ip -j route show default").empty());
    EXPECT_EQ(Hadro("network ip interface ipv4 set -i a0 -t none").status, 0);
    EXPECT_TRUE(ShJson("ip -j -4 addr show dev a0")[0]["addr_info"].empty());
    EXPECT_EQ(Record(HadroJson("network ip interface ipv4 get"), "Name", "a0")["Address Type"], "NONE");
}

TEST_F(InterfacesTest, TheRulesOfIpv4AddressesRefuseBeforeAnythingChanges) {
    Build();
    Sh("ip addr add 10.4.0.1/24 dev a1");
    std::string before = Sh("ip -j addr show") + Sh("ip -j route show");
    auto refused = [&](const std::string& arguments, const std::string& message) {
        auto result = Hadro("network ip interface ipv4 set " + arguments);
        EXPECT_EQ(result.status, 1) << arguments;
        EXPECT_EQ(result.err, message) << arguments;
    };
    const std::string prefix = "Error changing IPv4 configuration for the interface a0. Error was : ";
    refused("-i a0 -t static -I 10.2.0.5 -N 255.0.255.0",
            prefix + "Invalid IPv4 netmask 255.0.255.0: it must be a contiguous mask of 1 to 32 bits\n");
    refused("-i a0 -t static -I 10.2.0.0 -N 255.255.255.0",
            prefix + "IPv4 address 10.2.0.0 is the network address of 10.2.0.0/24\n");
    refused(
        "-i a0 -t static -I 224.0.0.5 -N 255.255.255.0",
        prefix + "IPv4 address 224.0.0.5 cannot be assigned to an interface: it is a multicast address\n");
    refused("-i a0 -t static -I 10.2.0.5 -N 255.255.255.0 -g 10.3.0.1",
            prefix + "IPv4 gateway 10.3.0.1 is not on the subnet 10.2.0.0/24 of a0\n");
    refused("-i a0 -t static -I 10.4.0.1 -N 255.255.255.0",
            prefix + "IPv4 address 10.4.0.1 is already in use by a1 on netstack 'defaultTcpipStack'\n");
    refused("-i a0 -t dhcp",
            prefix +
                "DHCP is not available on the Linux host: it needs a DHCP client, which the kernel does not "
                "have, and no client manages a0\n");
    // br0 is down: a gateway through it is refused before its address changes.
    auto down =
        Hadro("network ip interface ipv4 set -i br0 -t static -I 10.6.0.1 -N 255.255.255.0 -g 10.6.0.9");
    EXPECT_EQ(
        down.err,
        "Error changing IPv4 configuration for the interface br0. Error was : br0 is down, and the kernel "
        "routes through no interface that is down: enable it before giving it a gateway\n");
    EXPECT_EQ(Sh("ip -j addr show") + Sh("ip -j route show"), before);
    // An address is unique on its netstack only: another netstack may have it.
    EXPECT_EQ(Hadro("network ip interface ipv4 set -i g1 -t static -I 10.4.0.1 -N 255.255.255.0").status, 0);
    EXPECT_EQ(ShJson("ip -n glidex -j -4 addr show dev g1")[0]["addr_info"][0]["local"], "10.4.0.1");
}

TEST_F(InterfacesTest, ALeasedAddressShowsAsDhcpAndStaysTheClients) {
    Build();
    Sh("ip addr flush dev a0 && ip addr add 10.3.0.5/24 dev a0 valid_lft 600 preferred_lft 600"
       " && ip route add default via 10.3.0.1 dev a0 proto dhcp");
    auto record = HadroJson("network ip interface ipv4 get -i a0")[0];
    EXPECT_EQ(record["Address Type"], "DHCP");
    EXPECT_EQ(record["IPv4 Address"], "10.3.0.5");
    EXPECT_EQ(record["Gateway"], "10.3.0.1");
    EXPECT_EQ(record["DHCP DNS"], false);
    EXPECT_EQ(Hadro("network ip interface ipv4 set -i a0 -t dhcp").status, 0);  // as it is
    auto staticRefused = Hadro("network ip interface ipv4 set -i a0 -t static -I 10.3.0.9 -N 255.255.255.0");
    EXPECT_EQ(staticRefused.status, 1);
    EXPECT_TRUE(Has(staticRefused.err,
                    "The IPv4 address of a0 is leased by a DHCP client, which keeps it: stop the "
                    "client before giving a0 another IPv4 setting"))
        << staticRefused.err;
    auto dnsRefused = Hadro("network ip interface ipv4 set -i a0 -t dhcp -P true");
    EXPECT_TRUE(Has(dnsRefused.err,
                    "Whether DNS servers from DHCP are used is the DHCP client's setting, which the "
                    "Linux host does not change"))
        << dnsRefused.err;
    EXPECT_EQ(ShJson("ip -j -4 addr show dev a0")[0]["addr_info"][0]["local"], "10.3.0.5");
}

TEST_F(InterfacesTest, Ipv6SettingsAreTheInterfacesSysctlsAndItsDefaultRoute) {
    Build();
    auto record = Record(HadroJson("network ip interface ipv6 get"), "Name", "a0");
    EXPECT_EQ(record["IPv6 Enabled"], true);
    EXPECT_EQ(record["Router Adv Enabled"], Sysctl("ipv6/conf/a0/accept_ra") == "1\n");
    EXPECT_EQ(record["DHCPv6 Enabled"], false);
    EXPECT_EQ(record["Gateway"], "::");

    EXPECT_EQ(Hadro("network ip interface ipv6 address add -i a0 -I 2001:db8::1/64").status, 0);
    // While router advertisements are on, the command keeps the gateway theirs.
    EXPECT_EQ(Hadro("network ip interface ipv6 set -i a0 -g 2001:db8::99").err,
              "Cannot set an interface gateway when DHCP/Router Advertisement is enabled.\n");
    EXPECT_EQ(Hadro("network ip interface ipv6 set -i a0 -r false -g 2001:db8::99").status, 0);
    EXPECT_EQ(Sysctl("ipv6/conf/a0/accept_ra"), "0\n");
    auto fallback = ShJson("ip -j -6 route show default");
    ASSERT_EQ(fallback.size(), 1u);
    EXPECT_EQ(fallback[0]["gateway"], "2001:db8::99");
    EXPECT_EQ(fallback[0]["dev"], "a0");
    EXPECT_EQ(Record(HadroJson("network ip interface ipv6 get -n a0"), "Name", "a0")["Gateway"],
              "2001:db8::99");
    // A setting without a gateway takes the route away.
    EXPECT_EQ(Hadro("network ip interface ipv6 set -i a0 -r false").status, 0);
    EXPECT_TRUE(ShJson("ip -j -6 route show default").empty());

    // A forwarding interface accepts advertisements only with accept_ra 2.
    Sh("echo 1 > /proc/sys/net/ipv6/conf/a0/forwarding");
    EXPECT_EQ(Hadro("network ip interface ipv6 set -i a0 -r true").status, 0);
    EXPECT_EQ(Sysctl("ipv6/conf/a0/accept_ra"), "2\n");
    EXPECT_EQ(Record(HadroJson("network ip interface ipv6 get"), "Name", "a0")["Router Adv Enabled"], true);
}

TEST_F(InterfacesTest, WhatIpv6OnLinuxCannotDoIsRefusedAndChangesNothing) {
    Build();
    Sh("ip -6 addr add 2001:db8::1/64 dev a0 nodad");
    std::string before = Sysctl("ipv6/conf/a0/accept_ra") + Sh("ip -j -6 route show");
    const std::string prefix = "Error changing IPv6 configuration for the interface a0. Error was : ";
    EXPECT_EQ(
        Hadro("network ip interface ipv6 set -i a0 -d true").err,
        prefix +
            "DHCPv6 is not available on the Linux host: it needs a DHCPv6 client, which the kernel does "
            "not have, and no client manages a0\n");
    EXPECT_EQ(Hadro("network ip interface ipv6 set -i a0 -r true -P true").err,
              prefix +
                  "Whether DNS servers from DHCPv6 or router advertisements are used is up to the program "
                  "that reads them, which the Linux host does not change\n");
    // A gateway off the interface's subnets is refused before router advertisements are turned off.
    EXPECT_EQ(Hadro("network ip interface ipv6 set -i a0 -r false -g 2001:db8:9::1").err,
              prefix + "IPv6 gateway 2001:db8:9::1 is not on a subnet of a0\n");
    EXPECT_EQ(Sysctl("ipv6/conf/a0/accept_ra") + Sh("ip -j -6 route show"), before);
    auto badAddress = Hadro("network ip interface ipv6 address add -i a0 -I ff02::5/64");
    EXPECT_EQ(
        badAddress.err,
        "Error adding IPv6 address for the interface a0. Error was : IPv6 address ff02::5 is not a unicast "
        "address\n");
}

TEST_F(InterfacesTest, Ipv6AddressesAreTheKernelsAndStaticOnesOutliveTurningIpv6Off) {
    Build();
    EXPECT_EQ(Hadro("network ip interface ipv6 address add -i a0 -I 2001:db8::1/64").status, 0);
    EXPECT_EQ(
        Hadro("network ip interface ipv6 address add -i a0 -I 2001:db8::1/64").err,
        "Error adding IPv6 address for the interface a0. Error was : IPv6 address 2001:db8::1 is already "
        "configured as 2001:db8::1/64\n");
    auto kernel = ShJson("ip -j -6 addr show dev a0")[0]["addr_info"];
    auto list = HadroJson("network ip interface ipv6 address list -i a0");
    ASSERT_EQ(list.size(), kernel.size());
    for (const auto& address : kernel) {
        auto record = Record(list, "Address", address["local"]);
        ASSERT_FALSE(record.is_null()) << address;
        EXPECT_EQ(record["Netmask"], address["prefixlen"]);
        EXPECT_EQ(record["Type"], address["scope"] == "link" ? "AUTOCONF" : "STATIC");
        EXPECT_EQ(record["Status"], address.value("tentative", false) ? "TENTATIVE" : "PREFERRED");
    }

    EXPECT_EQ(Hadro("network ip interface ipv6 set -i a0 -e false").status, 0);
    EXPECT_EQ(Sysctl("ipv6/conf/a0/disable_ipv6"), "1\n");
    EXPECT_TRUE(ShJson("ip -j -6 addr show dev a0").empty());
    EXPECT_TRUE(Has(Slurp(document_), "2001:db8::1/64"));
    EXPECT_EQ(
        Hadro("network ip interface ipv6 address add -i a0 -I 2001:db8::2/64").err,
        "Error adding IPv6 address for the interface a0. Error was : IPv6 is off on a0: turn it on before "
        "giving it the address 2001:db8::2/64\n");
    EXPECT_EQ(Hadro("network ip interface ipv6 set -i a0 -e true").status, 0);
    EXPECT_EQ(Sysctl("ipv6/conf/a0/disable_ipv6"), "0\n");
    EXPECT_TRUE(Has(Sh("ip -6 addr show dev a0"), "2001:db8::1/64"));
    EXPECT_FALSE(Has(Slurp(document_), "2001:db8::1/64"));

    EXPECT_EQ(Hadro("network ip interface ipv6 address remove -i a0 -I 2001:db8::1/64").status, 0);
    EXPECT_FALSE(Has(Sh("ip -6 addr show dev a0"), "2001:db8::1"));
    EXPECT_EQ(
        Hadro("network ip interface ipv6 address remove -i a0 -I 2001:db8::1/64").err,
        "Error removing IPv6 address for the interface a0. Error was : IPv6 address 2001:db8::1/64 is not "
        "configured\n");
}

TEST_F(InterfacesTest, TagsLiveInTheHostsDocument) {
    Build();
    EXPECT_EQ(Hadro("network ip interface tag add -i a0 -t Management").status, 0);
    EXPECT_EQ(Hadro("network ip interface tag add -i a0 -t Storage").status, 0);
    EXPECT_EQ(Hadro("network ip interface tag get -i a0").out, "Tags: Management, Storage\n");
    EXPECT_EQ(HadroJson("network ip interface tag get -i a1")["Tags"], json::array());
    auto document = json::parse(Slurp(document_));
    EXPECT_EQ(document["interfaces"]["tags"]["defaultTcpipStack"]["a0"], json({"Management", "Storage"}));

    EXPECT_EQ(Hadro("network ip interface tag add -i a0 -t Nonsense").err,
              "Invalid tag name Nonsense\nSupported tags are: Management, Glidex, faultToleranceLogging, "
              "PellixReplication, PellixReplicationNFC, PellixProvisioning, Storage, StorageWitness\n");
    EXPECT_EQ(Hadro("network ip interface tag remove -i a0 -t Management").status, 0);
    EXPECT_EQ(
        Hadro("network ip interface tag remove -i a0 -t Management").err,
        "Error removing tag Management from interface a0. Error was : Tarkon network interface a0 does not "
        "carry the tag Management\n");
    EXPECT_EQ(Hadro("network ip interface tag get -i a0").out, "Tags: Storage\n");
    EXPECT_EQ(Hadro("network ip interface tag get -i nosuch").err,
              "Unable to find an interface with name nosuch\n");

    // The tags of an interface gone from its netstack go with the next change there.
    Sh("ip link del a0");
    EXPECT_EQ(Hadro("network ip interface tag add -i br0 -t Storage").status, 0);
    document = json::parse(Slurp(document_));
    EXPECT_FALSE(document["interfaces"]["tags"]["defaultTcpipStack"].contains("a0")) << document;
}

TEST_F(InterfacesTest, ADamagedDocumentIsRefusedAndKept) {
    Build();
    const std::string damaged = "{\"version\": 1, \"interfaces\": {\"tags\": [\"a0\"]}}\n";
    std::ofstream(document_) << damaged;
    auto result = Hadro("network ip interface tag get -i a0");
    EXPECT_EQ(result.status, 3);
    EXPECT_TRUE(Has(result.err, document_)) << result.err;
    EXPECT_EQ(Slurp(document_), damaged);
}

TEST_F(InterfacesTest, AReadNeedsNoPrivilegeAndAChangeNeedsRoot) {
    Build();
    auto list = HadroUnprivileged("network ip interface ipv4 get");
    EXPECT_EQ(list.status, 0) << list.err;
    EXPECT_TRUE(Has(list.out, "10.1.0.1"));
    // A netstack the user cannot enter is left out, with a word.
    EXPECT_FALSE(Has(list.out, "g1"));
    EXPECT_TRUE(Has(list.err, "netstack 'glidex' is left out")) << list.err;

    std::string before = Sh("ip -j addr show") + Sh("ip -j link show");
    for (const char* change :
         {"network ip interface ipv4 set -i a0 -t none", "network ip interface set -i a0 -e false",
          "network ip interface ipv6 address add -i a0 -I 2001:db8::7/64",
          "network ip interface tag add -i a0 -t Storage"}) {
        auto refused = HadroUnprivileged(change);
        EXPECT_EQ(refused.status, 1) << change;
        EXPECT_TRUE(Has(refused.err, "Changing the host's network needs root (CAP_NET_ADMIN)"))
            << refused.err;
    }
    EXPECT_EQ(Sh("ip -j addr show") + Sh("ip -j link show"), before);
    EXPECT_FALSE(Has(Slurp(document_), "Storage"));
}

TEST_F(InterfacesTest, MulticastGroupsAreTheInterfacesMemberships) {
    Build();
    Sh("ip -6 addr add 2001:db8::10/64 dev a0 nodad");
    auto groups = HadroJson("network multicast group list");
    for (const char* name : {"a0", "a1"}) {
        std::set<std::string> kernel, listed;
        auto maddr = ShJson(std::string("ip -j maddr show dev ") + name)[0]["maddr"];
        for (const auto& m : maddr) {
            if (m.contains("address")) kernel.insert(m["address"].get<std::string>());
        }
        for (const auto& record : groups) {
            if (record["Interface"] != name) continue;
            listed.insert(record["Group"].get<std::string>());
            EXPECT_GE(record["Refcount"], 1);
        }
        EXPECT_EQ(listed, kernel) << name;
    }
    EXPECT_EQ(Record(groups, "Group", "ff02::1:ff00:10")["Link Layer"], "33:33:ff:00:00:10");
    EXPECT_EQ(Record(groups, "Group", "224.0.0.1")["Link Layer"], "01:00:5e:00:00:01");
}

TEST_F(InterfacesTest, ANameInSeveralNetstacksMeansTheFirstWithAWord) {
    Build();
    Sh("ip -n glidex link set g1 name a0");
    auto result = Hadro("network ip interface ipv4 get -i a0");
    EXPECT_EQ(result.status, 0);
    EXPECT_TRUE(Has(result.out, "10.1.0.1"));
    EXPECT_TRUE(Has(result.err,
                    "interface a0 is in netstacks 'defaultTcpipStack', 'glidex': the one of "
                    "'defaultTcpipStack' is meant"))
        << result.err;
}

TEST_F(InterfacesTest, AGatewayBesideAnotherInterfacesDefaultRouteIsRefusedNamingIt) {
    Build();
    Sh("ip addr add 10.4.0.1/24 dev a1 && ip route add default via 10.1.0.2 dev a0");
    auto result =
        Hadro("network ip interface ipv4 set -i a1 -t static -I 10.4.0.1 -N 255.255.255.0 -g 10.4.0.9");
    EXPECT_EQ(result.status, 1);
    EXPECT_EQ(result.err,
              "Error changing IPv4 configuration for the interface a1. Error was : Netstack "
              "'defaultTcpipStack' has "
              "its IPv4 default route through a0 (via 10.1.0.2): remove it before giving a1 a gateway\n");
    auto fallback = ShJson("ip -j route show default");
    ASSERT_EQ(fallback.size(), 1u);
    EXPECT_EQ(fallback[0]["dev"], "a0");
}

}  // namespace

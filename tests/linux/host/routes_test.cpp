// Routes of the Linux host: "network ip route ..." against what ip route says of the test's own
// namespaces.
#include <map>

#include "namespace_host.h"

namespace {

using Hadro::Test::Has;
using Hadro::Test::Slurp;

using nlohmann::json;

class RoutesTest : public Hadro::Test::NamespaceHostTest {
protected:
    // a0 (10.1.0.1/24, 2001:db8::1/64) and b0 (10.4.0.1/24), each with its peer; netstack glidex
    // with g1 (10.1.0.2/24).
    void Build() {
        Sh("echo 0 > /proc/sys/net/ipv6/conf/all/accept_dad && echo 0 > "
           "/proc/sys/net/ipv6/conf/default/accept_dad");
        Sh("ip link add a0 type veth peer name a1 && ip link set a0 up && ip link set a1 up"
           " && ip addr add 10.1.0.1/24 dev a0 && ip -6 addr add 2001:db8::1/64 dev a0"
           " && ip link add b0 type veth peer name b1 && ip link set b0 up && ip link set b1 up"
           " && ip addr add 10.4.0.1/24 dev b0"
           " && ip netns add glidex && ip link add g0 type veth peer name g1 netns glidex"
           " && ip -n glidex addr add 10.1.0.2/24 dev g1 && ip -n glidex link set g1 up");
    }
};

// The routes of ip -j route as hadrocli's records show them ("default", the network without its
// prefix length, the unset gateway for a network the interface is on).
void ExpectSameRoutes(const json& kernel, const json& listed, const std::string& unset) {
    ASSERT_EQ(kernel.size(), listed.size()) << kernel << "\n" << listed;
    for (std::size_t i = 0; i < kernel.size(); ++i) {
        std::string dst = kernel[i]["dst"];
        EXPECT_EQ(dst.substr(0, dst.find('/')), listed[i]["Network"]) << kernel[i];
        EXPECT_EQ(kernel[i].value("gateway", unset), listed[i]["Gateway"]) << kernel[i];
        EXPECT_EQ(kernel[i]["dev"], listed[i]["Interface"]) << kernel[i];
    }
}

TEST_F(RoutesTest, Ipv4RoutesAreTheMainTablesAndChangeThroughTheInterfaceOnTheGatewaysSubnet) {
    Build();
    EXPECT_EQ(Hadro("network ip route ipv4 add -n 10.5.0.0/16 -g 10.4.0.9").status, 0);
    EXPECT_EQ(Hadro("network ip route ipv4 add -n default -g 10.1.0.254").status, 0);
    // Host bits are cleared.
    EXPECT_EQ(Hadro("network ip route ipv4 add -n 10.6.1.1/16 -g 10.1.0.254").status, 0);
    auto added = ShJson("ip -j route show 10.5.0.0/16");
    ASSERT_EQ(added.size(), 1u);
    EXPECT_EQ(added[0]["gateway"], "10.4.0.9");
    EXPECT_EQ(added[0]["dev"], "b0");
    EXPECT_EQ(added[0]["protocol"], "static");
    EXPECT_EQ(ShJson("ip -j route show 10.6.0.0/16").size(), 1u);

    auto listed = HadroJson("network ip route ipv4 list");
    ExpectSameRoutes(ShJson("ip -j route show"), listed, "0.0.0.0");
    EXPECT_EQ(listed[0]["Network"], "default");
    EXPECT_EQ(listed[0]["Netmask"], "0.0.0.0");
    for (const auto& record : listed)
        EXPECT_EQ(record["Source"], "MANUAL");

    // The rules every host keeps.
    EXPECT_EQ(Hadro("network ip route ipv4 add -n 10.5.0.0/16 -g 10.1.0.9").err,
              "A route to 10.5.0.0/16 already exists on netstack 'defaultTcpipStack' (via 10.4.0.9)\n");
    EXPECT_EQ(
        Hadro("network ip route ipv4 add -n 10.7.0.0/16 -g 10.9.0.1").err,
        "Gateway 10.9.0.1 is unreachable: no Tarkon interface of netstack 'defaultTcpipStack' is on its "
        "subnet\n");
    EXPECT_EQ(Hadro("network ip route ipv4 remove -n 10.1.0.0/24 -g 0.0.0.0").err,
              "The route to 10.1.0.0/24 belongs to the address of a0 and goes only with it\n");
    EXPECT_EQ(Hadro("network ip route ipv4 remove -n 10.8.0.0/16 -g 10.1.0.254").err,
              "Netstack 'defaultTcpipStack' has no route to 10.8.0.0/16 via 10.1.0.254\n");
    EXPECT_EQ(Hadro("network ip route ipv4 add -n 10.7.0.0/40 -g 10.1.0.9").status, 1);

    EXPECT_EQ(Hadro("network ip route ipv4 remove -n 10.5.0.0/16 -g 10.4.0.9").status, 0);
    EXPECT_TRUE(ShJson("ip -j route show 10.5.0.0/16").empty());
    // The default route goes by its gateway; another gateway is no default route.
    EXPECT_EQ(Hadro("network ip route ipv4 remove -n default -g 10.1.0.253").err,
              "10.1.0.253 is not a default route.\n");
    EXPECT_EQ(Hadro("network ip route ipv4 remove -n default -g 10.1.0.254").status, 0);
    EXPECT_TRUE(ShJson("ip -j route show default").empty());
}

TEST_F(RoutesTest, EachNetstackHasItsOwnRoutesAndSources) {
    Build();
    Sh("ip route add 10.20.0.0/16 via 10.1.0.7 proto dhcp && ip route add 10.21.0.0/16 via 10.1.0.7 proto bgp"
       " && ip route add blackhole 10.22.0.0/16");
    auto listed = HadroJson("network ip route ipv4 list");
    std::map<std::string, std::string> sources;
    for (const auto& record : listed)
        sources[record["Network"]] = record["Source"];
    EXPECT_EQ(sources["10.20.0.0"], "DHCP");
    EXPECT_EQ(sources["10.21.0.0"], "BGP");
    EXPECT_EQ(sources.count("10.22.0.0"), 0u);  // a blackhole leads through no interface

    EXPECT_EQ(Hadro("network ip route ipv4 add -n default -g 10.1.0.1 -N glidex").status, 0);
    auto glidex = ShJson("ip -n glidex -j route show default");
    ASSERT_EQ(glidex.size(), 1u);
    EXPECT_EQ(glidex[0]["dev"], "g1");
    ExpectSameRoutes(ShJson("ip -n glidex -j route show"), HadroJson("network ip route ipv4 list -N glidex"),
                     "0.0.0.0");
    EXPECT_TRUE(ShJson("ip -j route show default").empty());
    EXPECT_EQ(Hadro("network ip route ipv4 list -N nowhere").err,
              "Netstack instance 'nowhere' does not exist\n");
}

TEST_F(RoutesTest, Ipv6RoutesAndLinkLocalGateways) {
    Build();
    EXPECT_EQ(Hadro("network ip route ipv6 add -n 2001:db8:5::/48 -g 2001:db8::2").status, 0);
    auto added = ShJson("ip -j -6 route show 2001:db8:5::/48");
    ASSERT_EQ(added.size(), 1u);
    EXPECT_EQ(added[0]["gateway"], "2001:db8::2");
    EXPECT_EQ(added[0]["dev"], "a0");
    auto listed = HadroJson("network ip route ipv6 list");
    ExpectSameRoutes(ShJson("ip -j -6 route show"), listed, "::");
    bool found = false;
    for (const auto& record : listed) {
        if (record["Network"] != "2001:db8:5::") continue;
        found = true;
        EXPECT_EQ(record["Netmask"], "ffff:ffff:ffff::");
    }
    EXPECT_TRUE(found);

    // fe80::1 lies on the link of every interface with IPv6: it names none of them.
    auto ambiguous = Hadro("network ip route ipv6 add -n default -g fe80::1");
    EXPECT_EQ(ambiguous.status, 1);
    EXPECT_TRUE(Has(ambiguous.err, "Gateway fe80::1 is a link-local address, on the link of each of "))
        << ambiguous.err;
    Sh("echo 1 > /proc/sys/net/ipv6/conf/b0/disable_ipv6 && echo 1 > /proc/sys/net/ipv6/conf/a1/disable_ipv6"
       " && echo 1 > /proc/sys/net/ipv6/conf/b1/disable_ipv6");
    EXPECT_EQ(Hadro("network ip route ipv6 add -n default -g fe80::1").status, 0);
    auto fallback = ShJson("ip -j -6 route show default");
    ASSERT_EQ(fallback.size(), 1u);
    EXPECT_EQ(fallback[0]["dev"], "a0");
    EXPECT_EQ(Hadro("network ip route ipv6 remove -n default -g fe80::1").status, 0);
    EXPECT_TRUE(ShJson("ip -j -6 route show default").empty());
    EXPECT_EQ(Hadro("network ip route ipv6 remove -n 2001:db8:5::/48 -g 2001:db8::2").status, 0);
    EXPECT_TRUE(ShJson("ip -j -6 route show 2001:db8:5::/48").empty());
}

TEST_F(RoutesTest, AMultipathRouteIsListedOnceForEachNextHop) {
    Build();
    Sh("ip route add 10.30.0.0/16 nexthop via 10.1.0.9 dev a0 nexthop via 10.4.0.9 dev b0");
    std::vector<std::pair<std::string, std::string>> hops;
    for (const auto& record : HadroJson("network ip route ipv4 list")) {
        if (record["Network"] == "10.30.0.0") hops.emplace_back(record["Gateway"], record["Interface"]);
    }
    EXPECT_EQ(hops,
              (std::vector<std::pair<std::string, std::string>>{{"10.1.0.9", "a0"}, {"10.4.0.9", "b0"}}));
}

TEST_F(RoutesTest, AChangeNeedsRoot) {
    Build();
    EXPECT_EQ(HadroUnprivileged("network ip route ipv4 list").status, 0);
    auto refused = HadroUnprivileged("network ip route ipv4 add -n 10.5.0.0/16 -g 10.4.0.9");
    EXPECT_EQ(refused.status, 1);
    EXPECT_EQ(refused.err, "Changing the host's network needs root (CAP_NET_ADMIN)\n");
    EXPECT_TRUE(ShJson("ip -j route show 10.5.0.0/16").empty());
}

}  // namespace

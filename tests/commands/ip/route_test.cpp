// "network ip route ipv4|ipv6 ...": routes and default gateways of the netstacks.
#include "ip_test.h"

namespace IpTests {
namespace {

const Strings kIpv4 = {"Network", "Netmask", "Gateway", "Interface", "Source"};
const Strings kIpv6 = {"Network", "Netmask", "Gateway", "Interface"};

TEST_F(IpTest, RoutesAreListedPerNetstack) {
    EXPECT_EQ(Rows("network ip route ipv4 list", kIpv4),
              (Strings{"default 0.0.0.0 192.0.2.1 tkn0 MANUAL", "192.0.2.0 255.255.255.0 0.0.0.0 tkn0 MANUAL",
                       "198.18.0.0 255.255.0.0 192.0.2.254 tkn0 MANUAL",
                       "203.0.113.0 255.255.255.0 0.0.0.0 tkn2 DHCP"}));
    // An empty netstack is the default one.
    EXPECT_EQ(Run("network ip route ipv4 list -N ''").out, Run("network ip route ipv4 list").out);
    EXPECT_EQ(Rows("network ip route ipv4 list -N glidex", {"Network", "Interface"}),
              (Strings{"default tkn1", "198.51.100.0 tkn1"}));
    EXPECT_EQ(Json("network ip route ipv4 list -N PellixProvisioning"), nlohmann::json::array());
    EXPECT_EQ(Rows("network ip route ipv6 list", kIpv6),
              (Strings{"default :: 2001:db8:10::1 tkn0", "2001:db8:10:: ffff:ffff:ffff:ffff:: :: tkn0",
                       "2001:db8:30:: ffff:ffff:ffff:ffff:: :: tkn2", "fe80:: ffff:ffff:ffff:ffff:: :: tkn0",
                       "fe80:: ffff:ffff:ffff:ffff:: :: tkn2"}));

    auto r = Run("network ip route ipv6 list -N nostack");
    EXPECT_EQ(r.Errors(), Strings{"Netstack instance 'nostack' does not exist"});
    EXPECT_EQ(r.status, 1);
    AddFault("TknCtl::Network::RoutingInfoImpl::GetDefaultGatewaySource", "", "source unknown");
    EXPECT_EQ(Run("network ip route ipv4 list").Errors(), Strings{"source unknown"});
}

TEST_F(IpTest, RoutesGoThroughTheInterfaceThatReachesTheGateway) {
    ASSERT_EQ(Run("network ip route ipv4 add -n 10.1.0.0/16 -g 203.0.113.1").status, 0);
    ASSERT_EQ(Run("network ip route ipv6 add --network 2001:db8:99::/48 --gateway 2001:db8:30::1").status, 0);
    ASSERT_EQ(Run("network ip route ipv4 add -n 10.2.3.4/16 -g 198.51.100.7 -N glidex").status, 0);
    EXPECT_EQ(Rows("network ip route ipv4 list", kIpv4).back(),
              "10.1.0.0 255.255.0.0 203.0.113.1 tkn2 MANUAL");
    EXPECT_EQ(Rows("network ip route ipv6 list", kIpv6).back(),
              "2001:db8:99:: ffff:ffff:ffff:: 2001:db8:30::1 tkn2");
    // The network is kept without its host bits.
    EXPECT_EQ(Rows("network ip route ipv4 list -N glidex", {"Network", "Netmask"}).back(),
              "10.2.0.0 255.255.0.0");

    auto refused = [&](const std::string& line) {
        auto r = Run(line);
        EXPECT_EQ(r.status, 1) << line;
        return r.Errors().size() == 1 ? r.Errors()[0] : r.err;
    };
    EXPECT_EQ(refused("network ip route ipv4 add -n 10.1.0.0/16 -g 192.0.2.254"),
              "A route to 10.1.0.0/16 already exists on netstack 'defaultTcpipStack' (via 203.0.113.1)");
    EXPECT_EQ(
        refused("network ip route ipv4 add -n 10.3.0.0/16 -g 198.51.100.7"),
        "Gateway 198.51.100.7 is unreachable: no Tarkon interface of netstack 'defaultTcpipStack' is on its "
        "subnet");
    EXPECT_EQ(refused("network ip route ipv4 add -n 10.3.0.0/16 -g 10.0.0.300"),
              "Invalid IPv4 address '10.0.0.300'");
    EXPECT_EQ(refused("network ip route ipv4 add -n Default -g 192.0.2.1"),
              "Invalid IPv4 network 'Default' (expected address/prefix length 0-32)");
    EXPECT_EQ(refused("network ip route ipv6 add -n default -g 2001:db8:10::fe"),
              "A route to ::/0 already exists on netstack 'defaultTcpipStack' (via 2001:db8:10::1)");
    EXPECT_EQ(refused("network ip route ipv4 add -n 10.4.0.0/16 -g 192.0.2.1 -N nostack"),
              "Netstack instance 'nostack' does not exist");
    EXPECT_EQ(refused("network ip route ipv4 remove -n 10.1.0.0/16 -g 203.0.113.2"),
              "Netstack 'defaultTcpipStack' has no route to 10.1.0.0/16 via 203.0.113.2");
    EXPECT_EQ(refused("network ip route ipv4 remove -n 192.0.2.0/24 -g 0.0.0.0"),
              "The route to 192.0.2.0/24 belongs to the address of tkn0 and goes only with it");

    ASSERT_EQ(Run("network ip route ipv4 remove -n 10.1.0.0/16 -g 203.0.113.1").status, 0);
    ASSERT_EQ(Run("network ip route ipv6 remove -n 2001:db8:99::/48 -g 2001:db8:30::1").status, 0);
    EXPECT_EQ(Rows("network ip route ipv4 list", kIpv4).size(), 4u);
    EXPECT_EQ(Rows("network ip route ipv6 list", kIpv6).size(), 5u);

    AddFault("TknCtl::Network::RoutingInfoImpl::AddIpv6TarkonRoute", "defaultTcpipStack", "table full");
    EXPECT_EQ(refused("network ip route ipv6 add -n 2001:db8:99::/48 -g 2001:db8:30::1"), "table full");
}

TEST_F(IpTest, RemovingTheDefaultRouteClearsTheDefaultGateway) {
    // "Default" is no keyword; a network typed out in full is the default route all the same.
    EXPECT_EQ(Run("network ip route ipv4 remove -n Default -g 192.0.2.1").Errors(),
              Strings{"Invalid IPv4 network 'Default' (expected address/prefix length 0-32)"});
    auto r = Run("network ip route ipv4 remove -n 0.0.0.0/0 -g 192.0.2.9");
    EXPECT_EQ(r.Errors(), Strings{"192.0.2.9 is not a default route."});
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(Rows("network ip route ipv4 list", kIpv4).size(), 4u);

    StartJournal();
    ASSERT_EQ(Run("network ip route ipv4 remove -n default -g 192.0.2.1").status, 0);
    EXPECT_EQ(Journal("TknCtl::Network::RoutingInfoImpl::GetTarkonConfigDefaultGateway").size(), 0u);
    EXPECT_EQ(
        Journal("TknCtl::Network::RoutingInfoImpl::SetTarkonDefaultGateway"),
        Strings{"TknCtl::Network::RoutingInfoImpl::SetTarkonDefaultGateway defaultTcpipStack 0.0.0.0 false"});
    EXPECT_EQ(Rows("network ip route ipv4 list", {"Network"}),
              (Strings{"192.0.2.0", "198.18.0.0", "203.0.113.0"}));
    EXPECT_EQ(Section("routes")[0]["ipv4ConfigGateway"], "0.0.0.0");

    // A configured gateway whose route is not in force is removed as well.
    EditHost([](nlohmann::json& doc) {
        doc["routes"][0]["ipv4ConfigGateway"] = "192.0.2.5";
        doc["routes"][0]["ipv6"].erase(0);
        doc["routes"][0]["ipv6ConfigGateway"] = "2001:db8:10::5";
    });
    ASSERT_EQ(Run("network ip route ipv4 remove -n default -g 192.0.2.5").status, 0);
    EXPECT_EQ(Section("routes")[0]["ipv4ConfigGateway"], "0.0.0.0");
    EXPECT_EQ(Run("network ip route ipv6 remove -n default -g 2001:db8:10::1").Errors(),
              Strings{"2001:db8:10::1 is not a default route."});
    ASSERT_EQ(Run("network ip route ipv6 remove -n ::/0 -g 2001:db8:10::5").status, 0);
    EXPECT_EQ(Section("routes")[0]["ipv6ConfigGateway"], "::");

    // Adding a default route sets the default gateway again.
    ASSERT_EQ(Run("network ip route ipv4 add -n default -g 192.0.2.2").status, 0);
    EXPECT_EQ(Rows("network ip route ipv4 list", kIpv4).front(), "default 0.0.0.0 192.0.2.2 tkn0 MANUAL");
    EXPECT_EQ(Section("routes")[0]["ipv4ConfigGateway"], "192.0.2.2");
}

TEST_F(IpTest, RoutesFollowTheInterfaces) {
    // tkn0 leaves 192.0.2.0/24: its gateway routes go, the configured default gateway stays.
    ASSERT_EQ(Run("network ip interface ipv4 set -i tkn0 -t static -I 10.0.0.10 -N 255.255.255.0").status, 0);
    EXPECT_EQ(Rows("network ip route ipv4 list", {"Network", "Gateway", "Interface"}),
              (Strings{"203.0.113.0 0.0.0.0 tkn2", "10.0.0.0 0.0.0.0 tkn0"}));
    EXPECT_EQ(Section("routes")[0]["ipv4ConfigGateway"], "192.0.2.1");
    // Back on the subnet, the default route returns.
    ASSERT_EQ(Run("network ip interface ipv4 set -i tkn0 -t static -I 192.0.2.10 -N 255.255.255.0").status,
              0);
    EXPECT_EQ(Rows("network ip route ipv4 list", {"Network", "Gateway", "Interface"}),
              (Strings{"default 192.0.2.1 tkn0", "203.0.113.0 0.0.0.0 tkn2", "192.0.2.0 0.0.0.0 tkn0"}));

    // A removed interface takes its routes along.
    ASSERT_EQ(Run("network ip interface remove -i tkn2").status, 0);
    EXPECT_EQ(Rows("network ip route ipv6 list", {"Network", "Interface"}),
              (Strings{"default tkn0", "2001:db8:10:: tkn0", "fe80:: tkn0"}));
}

}  // namespace
}  // namespace IpTests

// The host-control operations of the IP services that no command reaches directly.
#include "hostctl/exception.h"
#include "hostctl/network/ip.h"
#include "ip_test.h"

namespace IpTests {
namespace {

using HostCtl::Lib::HostCtlException;
using HostCtl::Network::Ipv4Address;
using HostCtl::Network::Ipv6Address;
using TknCtl::Network::RoutingInfoImpl;

TEST_F(IpTest, DefaultGatewaysAreSetThroughTheRoutingObject) {
    RoutingInfoImpl routing("defaultTcpipStack");
    routing.SetTarkonDefaultGateway(Ipv4Address("192.0.2.2"), true);
    EXPECT_EQ(routing.GetTarkonDefaultGateway().GetStringAddress(), "192.0.2.2");
    EXPECT_EQ(routing.GetTarkonConfigDefaultGateway().GetStringAddress(), "192.0.2.2");
    EXPECT_EQ(routing.GetDefaultGatewaySource(RoutingInfoImpl::DEFAULT_IPV4_ROUTE), "DHCP");
    EXPECT_EQ(routing.GetCurrentTarkonRoutes().size(), 4u);  // replaced, not added
    EXPECT_THROW(routing.SetTarkonDefaultGateway(Ipv4Address("10.0.0.1"), false), HostCtlException);
    EXPECT_EQ(routing.GetTarkonDefaultGateway().GetStringAddress(), "192.0.2.2");

    routing.SetNetstackInstanceKey("glidex");
    EXPECT_TRUE(routing.GetIpv6TarkonDefaultGateway().IsUnspecified());
    // tkn1 has IPv6 off: no IPv6 gateway is reachable on glidex.
    EXPECT_THROW(routing.SetIpv6TarkonDefaultGateway(Ipv6Address("fe80::1")), HostCtlException);
    EXPECT_THROW(routing.SetNetstackInstanceKey("nostack"), HostCtlException);
    EXPECT_THROW(routing.GetDefaultGatewaySource(HostCtl::Network::Ipv4Network("10.0.0.0/8")),
                 HostCtlException);
}

TEST_F(IpTest, ADnsObjectWorksOnItsOwnCopyUntilSaved) {
    TknCtl::Network::DnsConfigImpl first("defaultTcpipStack");
    TknCtl::Network::DnsConfigImpl second("defaultTcpipStack");
    EXPECT_TRUE(first.IsStale());
    Ipv4Address server("10.0.0.53");
    first.AddNameServer(server);
    second.Refresh();
    EXPECT_EQ(second.GetNameServers().size(), 2u);  // not saved yet
    first.SaveConfig();
    second.Refresh();
    EXPECT_EQ(second.GetNameServers().back(), "10.0.0.53");
    EXPECT_EQ(Section("dns")[0]["servers"].size(), 3u);
}

}  // namespace
}  // namespace IpTests

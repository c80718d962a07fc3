// "network ip neighbor|connection|get|set" and "network multicast group list".
#include "ip_test.h"

namespace IpTests {
namespace {

const Strings kNeighbor = {"Neighbor", "Tknnic", "Expiry", "State", "Type"};

TEST_F(IpTest, NeighboursAreListedByVersionAndInterface) {
    EXPECT_EQ(
        Rows("network ip neighbor list", kNeighbor),
        (Strings{"192.0.2.1 tkn0 1184  Dynamic", "192.0.2.53 tkn0 903  Dynamic", "192.0.2.254 tkn0 0  Static",
                 "203.0.113.1 tkn2 611  Dynamic", "2001:db8:10::1 tkn0 22 Reachable Router",
                 "fe80::1c:73ff:fe00:1 tkn0 14 Stale Router", "2001:db8:10::53 tkn0 8 Delay Dynamic"}));
    EXPECT_EQ(Rows("network ip neighbor list -v 4 -i tkn2", kNeighbor),
              Strings{"203.0.113.1 tkn2 611  Dynamic"});
    EXPECT_EQ(Rows("network ip neighbor list -v 6 -i tkn2", kNeighbor), Strings{});
    EXPECT_EQ(Rows("network ip neighbor list -N glidex", {"Neighbor", "Mac Address"}),
              Strings{"198.51.100.22 02:48:44:99:00:22"});
    EXPECT_NE(Run("network ip neighbor list -v 4").out.find("1184 sec"), std::string::npos);

    // IPv6 off: no IPv6 neighbours, and no error.
    ASSERT_EQ(Run("network ip set --ipv6-enabled false").status, 0);
    EXPECT_EQ(Json("network ip neighbor list -v 6"), nlohmann::json::array());
    EXPECT_EQ(Rows("network ip neighbor list", kNeighbor).size(), 4u);

    auto r = Run("network ip neighbor list -i tkn9");
    EXPECT_EQ(r.Errors(), Strings{"Unable to find a Tarkon interface with the name tkn9"});
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(Run("network ip neighbor list -v 5").status, 2);
    AddFault("TknCtl::Network::RoutingInfoImpl::GetIpv4NeighborType", "", "table busy");
    EXPECT_EQ(Run("network ip neighbor list").Errors(), Strings{"table busy"});
}

TEST_F(IpTest, NeighboursAreRemovedPerAddressAndInterface) {
    ASSERT_EQ(Run("network ip neighbor remove -v 4 -a 192.0.2.53 -i tkn0").status, 0);
    ASSERT_EQ(Run("network ip neighbor remove -v 6 -a 2001:db8:10::1").status, 0);
    EXPECT_EQ(
        Rows("network ip neighbor list", {"Neighbor"}),
        (Strings{"192.0.2.1", "192.0.2.254", "203.0.113.1", "fe80::1c:73ff:fe00:1", "2001:db8:10::53"}));
    EXPECT_EQ(Run("network ip neighbor remove -v 4 -a 192.0.2.53").Errors(),
              Strings{"No neighbour entry for 192.0.2.53 on netstack 'defaultTcpipStack'"});
    EXPECT_EQ(Run("network ip neighbor remove -v 4 -a 192.0.2.1 -i tkn2").Errors(),
              Strings{"No neighbour entry for 192.0.2.1 on tkn2"});
    EXPECT_EQ(Run("network ip neighbor remove -v 4 -a 192.0.2.1 -i tkn9").Errors(),
              Strings{"Unable to find a Tarkon interface with the name tkn9"});
    EXPECT_EQ(Run("network ip neighbor remove -v 4 -a 2001:db8::1").Errors(),
              Strings{"Invalid IPv4 address '2001:db8::1'"});

    // The interface's netstack wins over --netstack.
    StartJournal();
    ASSERT_EQ(Run("network ip neighbor remove -v 4 -a 198.51.100.22 -i tkn1 -N defaultTcpipStack").status, 0);
    EXPECT_EQ(Journal("TknCtl::Network::RoutingInfoImpl::SetNetstackInstanceKey"),
              Strings{"TknCtl::Network::RoutingInfoImpl::SetNetstackInstanceKey glidex"});
    EXPECT_EQ(Json("network ip neighbor list -N glidex"), nlohmann::json::array());

    // IPv6 off: nothing is removed, and that is no error.
    ASSERT_EQ(Run("network ip set -e false").status, 0);
    auto r = Run("network ip neighbor remove -v 6 -a 2001:db8:10::53");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(Section("neighbors")[0]["ipv6"].size(), 2u);
}

TEST_F(IpTest, ConnectionsAreListedTcpThenUdpThenIp) {
    Strings protos;
    for (const auto& c : Json("network ip connection list"))
        protos.push_back(c["Proto"]);
    EXPECT_EQ(protos, (Strings{"tcp", "tcp", "tcp", "tcp", "tcp", "tcp", "tcp", "tcp", "udp", "udp", "udp",
                               "ip", "ip"}));
    EXPECT_EQ(Rows("network ip connection list -t tcp",
                   {"Local Address", "Foreign Address", "State", "World Name"})[1],
              "[::]:22 [::]:0 LISTEN sshd");
    EXPECT_EQ(Rows("network ip connection list -t tcp", {"Local Address", "Foreign Address", "CC Algo"})[2],
              "192.0.2.10:22 198.51.100.77:51234 newreno");
    EXPECT_EQ(Rows("network ip connection list -t udp -N glidex", {"Proto"}), Strings{});
    EXPECT_EQ(Rows("network ip connection list -N glidex", {"Send Q", "State", "World ID", "World Name"}),
              (Strings{"0 LISTEN 2097733 hadrod", "131072 ESTABLISHED 2097733 hadrod"}));

    // States beyond TIME_WAIT have no name; SYN_RCVD is shown as RCVD.
    EditHost([](nlohmann::json& doc) {
        doc["connections"][1]["connections"][0]["state"] = 11;
        doc["connections"][1]["connections"][1]["state"] = 3;
    });
    EXPECT_EQ(Rows("network ip connection list -N glidex", {"State"}), (Strings{"", "RCVD"}));

    // IPv6 off: IPv6 sockets are gone.
    ASSERT_EQ(Run("network ip set -e false").status, 0);
    EXPECT_EQ(Json("network ip connection list -t ip").size(), 1u);

    auto r = Run("network ip connection list -N nostack");
    EXPECT_EQ(r.Errors(),
              (Strings{"Unable to get connection list.", "Netstack instance 'nostack' does not exist"}));
    EXPECT_EQ(r.out, "");
    AddFault("TknCtl::Resource::ResourceInfoImpl::GetWorldName", "2098012", "world gone");
    EXPECT_EQ(Run("network ip connection list -t udp").Errors(),
              (Strings{"Unable to get connection list.", "world gone"}));
}

TEST_F(IpTest, GlobalIpv6SwitchTakesEffectAtOnce) {
    EXPECT_EQ(Run("network ip get").out, "IPv6 Enabled: true\n");
    StartJournal();
    auto r = Run("network ip set");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, "");
    EXPECT_TRUE(Journal().empty());
    ASSERT_EQ(Run("network ip set -e off").status, 0);
    EXPECT_EQ(Json("network ip get")["IPv6 Enabled"], false);
    ASSERT_EQ(Run("network ip set -e true").status, 0);
    EXPECT_EQ(Json("network ip get")["IPv6 Enabled"], true);

    AddFault("TknCtl::Network::NetworkInfoImpl::SetTknIpv6Enabled", "", "needs maintenance mode");
    EXPECT_EQ(Run("network ip set -e false").Errors(), Strings{"needs maintenance mode"});
    AddFault("TknCtl::Network::NetworkInfoImpl::IsTknIpv6Enabled", "", "settings unreadable");
    EXPECT_EQ(Run("network ip get").Errors(), Strings{"settings unreadable"});
}

TEST_F(IpTest, MulticastMembershipsOfEveryInterface) {
    EXPECT_EQ(Run("network multicast group list").out,
              "Interface  Refcount  Group            Link Layer\n"
              "---------  --------  ---------------  -----------------\n"
              "tkn0       1         224.0.0.1        01:00:5e:00:00:01\n"
              "tkn0       1         ff02::1          33:33:00:00:00:01\n"
              "tkn0       2         ff02::1:ff00:10  33:33:ff:00:00:10\n"
              "tkn1       1         224.0.0.1        01:00:5e:00:00:01\n"
              "tkn2       2         224.0.0.251      01:00:5e:00:00:fb\n");
    ASSERT_EQ(Run("network ip interface remove -i tkn0").status, 0);
    EXPECT_EQ(Rows("network multicast group list", {"Interface", "Group"}),
              (Strings{"tkn1 224.0.0.1", "tkn2 224.0.0.251"}));
    AddFault("HostCtl::Network::TknNic::GetMulticastGroups", "tkn2", "no groups");
    EXPECT_EQ(Run("network multicast group list").Errors(), Strings{"no groups"});
}

TEST_F(IpTest, HelpOfTheServiceCommands) {
    auto neighbor = Json("network ip neighbor list --help");
    EXPECT_EQ(neighbor["parameters"][0]["description"], "IP version : [4, 6, all]");
    EXPECT_EQ(neighbor["output-parameters"][1]["key"], "units:NetworkNeighbor.Expiry");
    auto dns = Json("network ip dns server remove --help");
    EXPECT_EQ(dns["parameters"][1]["type"], "flag");
    EXPECT_EQ(dns["parameters"][2]["description"], " ");
    EXPECT_EQ(Json("network multicast group list --help")["output-parameters"][0]["key"], "fields:Interface");
    EXPECT_EQ(Json("network ip route ipv4 remove --help")["parameters"][1]["description"],
              "The Ipv4 address of the gateway through which a route to be removed");
}

}  // namespace
}  // namespace IpTests

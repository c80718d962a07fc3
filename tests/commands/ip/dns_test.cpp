// "network ip dns server|search ...": the resolver configuration of the netstacks.
#include "ip_test.h"

namespace IpTests {
namespace {

nlohmann::json List(std::initializer_list<const char*> items) {
    auto list = nlohmann::json::array();
    for (const char* item : items)
        list.push_back(item);
    return list;
}

TEST_F(IpTest, ServersAreKeptInUseOrder) {
    EXPECT_EQ(Run("network ip dns server list").out, "DNS Servers: 192.0.2.53, 2001:db8:10::53\n");
    StartJournal();
    ASSERT_EQ(Run("network ip dns server add -s 198.51.100.53").status, 0);
    // IPv4 is tried first, then IPv6; the address is kept in its canonical form.
    ASSERT_EQ(Run("network ip dns server add --server 2001:DB8:0:0::99").status, 0);
    EXPECT_EQ(Journal("TknCtl::Network::DnsConfigImpl"),
              (Strings{"TknCtl::Network::DnsConfigImpl::AddNameServer defaultTcpipStack 198.51.100.53",
                       "TknCtl::Network::DnsConfigImpl::SaveConfig defaultTcpipStack",
                       "TknCtl::Network::DnsConfigImpl::AddNameServer defaultTcpipStack 2001:db8::99",
                       "TknCtl::Network::DnsConfigImpl::SaveConfig defaultTcpipStack"}));
    EXPECT_EQ(Json("network ip dns server list")["DNS Servers"],
              List({"192.0.2.53", "2001:db8:10::53", "198.51.100.53", "2001:db8::99"}));

    auto before = Section("dns");
    auto r = Run("network ip dns server add -s 192.0.2.300");
    EXPECT_EQ(r.Errors(),
              Strings{"The specified address '192.0.2.300' is not recognised as a valid IP address"});
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(Run("network ip dns server add -s 2001:db8:10:0::53").Errors(),
              Strings{"DNS server 2001:db8:10::53 is already configured"});
    EXPECT_EQ(Run("network ip dns server remove -s 10.9.9.9").Errors(),
              Strings{"DNS server 10.9.9.9 is not configured"});
    EXPECT_EQ(Run("network ip dns server remove").Errors(),
              Strings{"You must specify exactly one of: --all, --server"});
    EXPECT_EQ(Run("network ip dns server remove -s nonsense").Errors(),
              Strings{"The specified address 'nonsense' is not recognised as a valid IP address"});
    EXPECT_EQ(Section("dns"), before);

    ASSERT_EQ(Run("network ip dns server remove -s 2001:db8:10::53").status, 0);
    EXPECT_EQ(Json("network ip dns server list")["DNS Servers"],
              List({"192.0.2.53", "198.51.100.53", "2001:db8::99"}));
    // --all wins over --server, whatever its value.
    ASSERT_EQ(Run("network ip dns server remove --all --server nonsense").status, 0);
    EXPECT_EQ(Json("network ip dns server list")["DNS Servers"], nlohmann::json::array());
    // Each netstack has its own servers; the glidex list stays empty.
    ASSERT_EQ(Run("network ip dns server add -s 198.51.100.53 -N glidex").status, 0);
    EXPECT_EQ(Json("network ip dns server list -N glidex")["DNS Servers"], List({"198.51.100.53"}));
    EXPECT_EQ(Json("network ip dns server list -N ''")["DNS Servers"], nlohmann::json::array());
}

TEST_F(IpTest, TheServerListIsReadOnceAndChangesAreSaved) {
    StartJournal();
    ASSERT_EQ(Run("network ip dns server list").status, 0);
    EXPECT_EQ(Journal(), Strings{"TknCtl::Network::DnsConfigImpl::Refresh defaultTcpipStack"});

    AddFault("TknCtl::Network::DnsConfigImpl::SaveConfig", "defaultTcpipStack", "resolver file read-only");
    auto r = Run("network ip dns server add -s 10.0.0.53");
    EXPECT_EQ(r.Errors(), Strings{"resolver file read-only"});
    EXPECT_EQ(Json("network ip dns server list")["DNS Servers"], List({"192.0.2.53", "2001:db8:10::53"}));
    EXPECT_EQ(Run("network ip dns server list -N nostack").Errors(),
              Strings{"Netstack instance 'nostack' does not exist"});
    AddFault("TknCtl::Network::DnsConfigImpl::Refresh", "", "no resolver");
    EXPECT_EQ(Run("network ip dns server list").Errors(), Strings{"no resolver"});
}

TEST_F(IpTest, SearchDomainsAreKeptInSearchOrder) {
    EXPECT_EQ(Run("network ip dns search list").out, "DNS Search Domains: lab.example.com, example.com\n");
    EXPECT_EQ(Json("network ip dns search list -N glidex")["DNS Search Domains"], nlohmann::json::array());
    ASSERT_EQ(Run("network ip dns search add -d corp.example.org").status, 0);
    ASSERT_EQ(Run("network ip dns search remove --domain lab.example.com").status, 0);
    EXPECT_EQ(Json("network ip dns search list")["DNS Search Domains"],
              List({"example.com", "corp.example.org"}));

    auto before = Section("dns");
    EXPECT_EQ(Run("network ip dns search add -d Example.COM.").Errors(),
              Strings{"Search domain Example.COM. is already configured"});
    EXPECT_EQ(
        Run("network ip dns search add -d 'two words'").Errors(),
        Strings{"Invalid search domain 'two words': it may hold only letters, digits, hyphens and dots"});
    EXPECT_EQ(Run("network ip dns search add -d -bad.example").Errors(),
              Strings{"Invalid search domain '-bad.example': a label starts or ends with a hyphen"});
    EXPECT_EQ(Run("network ip dns search add -d a..b").Errors(),
              Strings{"Invalid search domain 'a..b': it has an empty label"});
    EXPECT_EQ(Run("network ip dns search remove -d lab.example.com").Errors(),
              Strings{"Search domain 'lab.example.com' is not configured"});
    EXPECT_EQ(Section("dns"), before);

    AddFault("TknCtl::Network::DnsConfigImpl::GetSearchDomainsString", "glidex", "unreadable");
    EXPECT_EQ(Run("network ip dns search list -N glidex").Errors(), Strings{"unreadable"});
    AddFault("TknCtl::Network::DnsConfigImpl::RemoveSearchDomain", "", "locked");
    EXPECT_EQ(Run("network ip dns search remove -d example.com").Errors(), Strings{"locked"});
}

}  // namespace
}  // namespace IpTests

// "network firewall ruleset ...": list, set, rule list, allowedip list/add/remove, client get/add/remove.
#include "firewall_test.h"

namespace Hadro::Test {
namespace {

using Strings = std::vector<std::string>;

class FirewallRulesetTest : public FirewallTest {
protected:
    // The "Allowed IP Addresses" of one ruleset, as listed.
    nlohmann::json AllowedIps(const std::string& id) {
        auto r = Run("--formatter=json network firewall ruleset allowedip list -r " + id);
        EXPECT_EQ(r.status, 0) << r.err;
        auto list = nlohmann::json::parse(r.out);
        EXPECT_EQ(list.size(), 1u);
        return list.at(0).at("Allowed IP Addresses");
    }
};

constexpr const char* kNotLoaded = "The firewall module 'hadrofw' is not loaded";

// ---------------------------------------------------------------- listing and selection

TEST_F(FirewallRulesetTest, ListsEveryRulesetOrOne) {
    auto r = Run("network firewall ruleset list");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out,
              "Name         Enabled\n"
              "-----------  -------\n"
              "sshServer    true\n"
              "ntpClient    false\n"
              "webAccess    true\n"
              "dhcpClient   true\n"
              "glidex       true\n"
              "syslogRelay  false\n");
    EXPECT_EQ(Run("--formatter=json network firewall ruleset list --ruleset-id ntpClient").out,
              "[{\"Name\":\"ntpClient\",\"Enabled\":false}]\n");

    EditFirewall([](nlohmann::json& fw) { fw["rulesets"] = nlohmann::json::array(); });
    r = Run("--formatter=json network firewall ruleset list");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "[]\n");
}

TEST_F(FirewallRulesetTest, SelectionByIdRefusesUnknownIdsAndFailedLookups) {
    for (const char* list : {"list", "rule list", "allowedip list"}) {
        SCOPED_TRACE(list);
        auto r = Run(std::string("network firewall ruleset ") + list + " -r nope");
        EXPECT_EQ(r.status, 1);
        EXPECT_EQ(r.out, "");
        EXPECT_EQ(r.Errors(), Strings{"Ruleset Not Found: nope"});
    }

    AddFault("TknCtl::System::SystemInfoImpl::GetFirewallRulesetById", "webAccess", "lookup failed", 1);
    EXPECT_EQ(Run("network firewall ruleset list -r webAccess").Errors(),
              Strings{"Failed to check loaded status: webAccess"});
    AddFault("HostCtl::System::FirewallRuleset::IsValid", "webAccess", "lookup failed", 1);
    EXPECT_EQ(Run("network firewall ruleset rule list -r webAccess").Errors(),
              Strings{"Failed to check loaded status: webAccess"});

    // Without the module nothing can be listed.
    UnloadModule();
    EXPECT_EQ(Run("network firewall ruleset allowedip list -r webAccess").Errors(),
              Strings{"Failed to check loaded status: webAccess"});
    EXPECT_EQ(Run("network firewall ruleset list").Errors(), Strings{kNotLoaded});
}

TEST_F(FirewallRulesetTest, ListingReportsFailuresWhileBuildingRecords) {
    AddFault("HostCtl::System::FirewallRuleset::GetRules", "glidex", "rules unreadable");
    auto r = Run("network firewall ruleset rule list");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"rules unreadable"});
}

TEST_F(FirewallRulesetTest, RuleListRendersEachRule) {
    auto r = Run("network firewall ruleset rule list");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out,
              "Ruleset      Direction  Protocol  Port Type  Port Begin  Port End\n"
              "-----------  ---------  --------  ---------  ----------  --------\n"
              "sshServer    Inbound    TCP       Dst        22          22\n"
              "ntpClient    Outbound   UDP       Dst        123         123\n"
              "webAccess    Inbound    TCP       Dst        443         443\n"
              "webAccess    Inbound    TCP       Dst        80          80\n"
              "dhcpClient   Inbound    UDP       Dst        68          68\n"
              "dhcpClient   Outbound   UDP       Src        68          68\n"
              "glidex       Inbound    TCP       Dst        8000        8000\n"
              "glidex       Outbound   TCP       Dst        8000        8000\n"
              "syslogRelay  Outbound   UDP       Dst        514         514\n"
              "syslogRelay  Outbound   TCP       Dst        1514        1520\n");
    EXPECT_EQ(Run("--formatter=json network firewall ruleset rule list -r dhcpClient").out,
              "[{\"Ruleset\":\"dhcpClient\",\"Port Type\":\"Dst\",\"Port Begin\":68,\"Port End\":68,"
              "\"Direction\":\"Inbound\",\"Protocol\":\"UDP\"},"
              "{\"Ruleset\":\"dhcpClient\",\"Port Type\":\"Src\",\"Port Begin\":68,\"Port End\":68,"
              "\"Direction\":\"Outbound\",\"Protocol\":\"UDP\"}]\n");

    // A ruleset without rules contributes nothing.
    EditFirewall([](nlohmann::json& fw) { fw["rulesets"][0]["rules"] = nlohmann::json::array(); });
    EXPECT_EQ(Run("--formatter=json network firewall ruleset rule list -r sshServer").out, "[]\n");
}

TEST_F(FirewallRulesetTest, AllowedIpListShowsAllOrTheKindsApart) {
    auto r = Run("network firewall ruleset allowedip list");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out,
              "Ruleset      Allowed IP Addresses\n"
              "-----------  -----------------------------------------------------------------------------\n"
              "sshServer    All\n"
              "ntpClient    All\n"
              "webAccess    192.0.2.200, 192.0.2.201, 2001:db8:10::200, 198.51.100.0/24, 2001:db8:20::/64\n"
              "dhcpClient   All\n"
              "glidex       All\n"
              "syslogRelay  2001:db8:30::/48\n");

    AddFault("HostCtl::System::FirewallRuleset::GetAllowedIps", "webAccess", "allowed list unreadable", 1);
    EXPECT_EQ(Run("network firewall ruleset allowedip list").Errors(), Strings{"allowed list unreadable"});

    // An empty explicit list is an empty list, not "All".
    EditFirewall([](nlohmann::json& fw) { fw["rulesets"][5]["allowedIps"] = nlohmann::json::array(); });
    EXPECT_EQ(AllowedIps("syslogRelay"), nlohmann::json::array());
}

// ---------------------------------------------------------------- ruleset set

TEST_F(FirewallRulesetTest, SetNeedsAParameterBeforeAnyLookup) {
    StartJournal();
    auto r = Run("network firewall ruleset set -r nope");
    EXPECT_EQ(r.Errors(), Strings{"Need parameter --enabled or --allowed-all"});
    EXPECT_TRUE(Journal().empty());
    EXPECT_EQ(Run("network firewall ruleset set -r nope -e true").Errors(), Strings{"Invalid Ruleset Id."});
}

TEST_F(FirewallRulesetTest, SetChangesAllowedAllThenEnabled) {
    StartJournal();
    auto r = Run("network firewall ruleset set -r sshServer --allowed-all false --enabled false");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(Journal("HostCtl::System::FirewallRuleset"),
              (Strings{"HostCtl::System::FirewallRuleset::IsValid sshServer",
                       "HostCtl::System::FirewallRuleset::IsEnabled sshServer",
                       "HostCtl::System::FirewallRuleset::IsAllowedAll sshServer",
                       "HostCtl::System::FirewallRuleset::SetAllowedAll sshServer false",
                       "HostCtl::System::FirewallRuleset::Disable sshServer"}));
    EXPECT_EQ(Ruleset("sshServer")["allowedAll"], false);
    EXPECT_EQ(Ruleset("sshServer")["enabled"], false);

    r = Run("network firewall ruleset set -r ntpClient -e true");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(Ruleset("ntpClient")["enabled"], true);
}

TEST_F(FirewallRulesetTest, SetRefusesAllowedAllInForceButAcceptsEnabledInForce) {
    auto r = Run("network firewall ruleset set -r sshServer -a true -e false");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"Already allowed all ip"});
    EXPECT_EQ(Ruleset("sshServer")["enabled"], true);
    EXPECT_EQ(Run("network firewall ruleset set -r webAccess -a false -e false").Errors(),
              Strings{"Already use allowed ip list"});
    EXPECT_EQ(Ruleset("webAccess")["enabled"], true);

    StartJournal();
    r = Run("network firewall ruleset set -r webAccess -e true");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_TRUE(Journal("HostCtl::System::FirewallRuleset::Enable").empty());
    EXPECT_TRUE(Journal("HostCtl::System::FirewallRuleset::Disable").empty());
}

TEST_F(FirewallRulesetTest, SetReportsTheLibrarysMessage) {
    AddFault("HostCtl::System::FirewallRuleset::Enable", "ntpClient", "ruleset locked");
    EXPECT_EQ(Run("network firewall ruleset set -r ntpClient -e true").Errors(), Strings{"ruleset locked"});
    UnloadModule();
    EXPECT_EQ(Run("network firewall ruleset set -r ntpClient -e true").Errors(), Strings{kNotLoaded});
}

// ---------------------------------------------------------------- allowed addresses

TEST_F(FirewallRulesetTest, AllowedIpGuardsComeInOrder) {
    for (const char* verb : {"add", "remove"}) {
        SCOPED_TRACE(verb);
        const std::string command = std::string("network firewall ruleset allowedip ") + verb;
        EXPECT_EQ(Run(command + " -r nope -i ''").Errors(), Strings{"Invalid Ruleset Id."});
        // The allowed-all guard comes before the empty-address check.
        EXPECT_EQ(Run(command + " -r sshServer -i ''").Errors(),
                  Strings{"Couldn't update allowed ip list when allowed-all flag is true."});
        EXPECT_EQ(Run(command + " -r webAccess -i ''").Errors(), Strings{"Invalid allowedip parameter."});
    }
}

TEST_F(FirewallRulesetTest, AllowedIpListKeepsTheFourKindsApartInTheirOrder) {
    EditFirewall([](nlohmann::json& fw) { fw["rulesets"][5]["allowedIps"] = nlohmann::json::array(); });
    for (const char* address : {"fd00:1::/32", "10.0.0.0/8", "2001:db8::9", "192.0.2.7", "172.16.0.0/12",
                                "2001:db8::1", "192.0.2.1"}) {
        auto r = Run(std::string("network firewall ruleset allowedip add -r syslogRelay -i ") + address);
        EXPECT_EQ(r.status, 0) << address << ": " << r.err;
        EXPECT_EQ(r.out, "");
    }
    EXPECT_EQ(AllowedIps("syslogRelay"),
              (nlohmann::json{"192.0.2.7", "192.0.2.1", "2001:db8::9", "2001:db8::1", "10.0.0.0/8",
                              "172.16.0.0/12", "fd00:1::/32"}));

    EXPECT_EQ(Run("network firewall ruleset allowedip remove -r syslogRelay -i 192.0.2.7").status, 0);
    EXPECT_EQ(Run("network firewall ruleset allowedip remove -r syslogRelay -i fd00:1::/32").status, 0);
    EXPECT_EQ(AllowedIps("syslogRelay"),
              (nlohmann::json{"192.0.2.1", "2001:db8::9", "2001:db8::1", "10.0.0.0/8", "172.16.0.0/12"}));
}

TEST_F(FirewallRulesetTest, AllowedIpHostRules) {
    const std::string add = "network firewall ruleset allowedip add -r webAccess -i ";
    const std::string remove = "network firewall ruleset allowedip remove -r webAccess -i ";
    const std::string invalid =
        "': expected an IPv4 or IPv6 address or a network in CIDR form (address/prefix length)";
    for (const char* bad :
         {"host.example", "10.0.0.1/33", "2001:db8::/129", "10.0.0.256", "10.0.0.0/", "all"}) {
        EXPECT_EQ(Run(add + bad).Errors(), Strings{"Invalid allowed address '" + std::string(bad) + invalid});
        EXPECT_EQ(Run(remove + bad).Errors(),
                  Strings{"Invalid allowed address '" + std::string(bad) + invalid});
    }
    // Duplicates are found whatever the notation.
    EXPECT_EQ(Run(add + "2001:DB8:10:0::200").Errors(),
              Strings{"'2001:DB8:10:0::200' is already on the allowed list of ruleset 'webAccess'"});
    EXPECT_EQ(Run(add + "198.51.100.77/24").Errors(),
              Strings{"'198.51.100.77/24' is already on the allowed list of ruleset 'webAccess'"});
    EXPECT_EQ(Run(remove + "203.0.113.9").Errors(),
              Strings{"'203.0.113.9' is not on the allowed list of ruleset 'webAccess'"});
    // A network is kept with its host bits cleared.
    EXPECT_EQ(Run(add + "10.20.30.40/16").status, 0);
    EXPECT_EQ(Ruleset("webAccess")["allowedIps"].back(), "10.20.0.0/16");
    EXPECT_EQ(Run(remove + "10.20.99.1/16").status, 0);
    EXPECT_EQ(Run(remove + "2001:db8:20:0:0::/64").status, 0);
    EXPECT_EQ(Ruleset("webAccess")["allowedIps"],
              (nlohmann::json{"198.51.100.0/24", "192.0.2.200", "2001:db8:10::200", "192.0.2.201"}));
}

TEST_F(FirewallRulesetTest, AllowedIpPassesTheTextUnchanged) {
    StartJournal();
    EXPECT_EQ(Run("network firewall ruleset allowedip add -r webAccess -i 2001:DB8::5").status, 0);
    EXPECT_EQ(Journal("HostCtl::System::FirewallRuleset::AddAllowedIp"),
              Strings{"HostCtl::System::FirewallRuleset::AddAllowedIp webAccess 2001:DB8::5"});
    AddFault("HostCtl::System::FirewallRuleset::RemoveAllowedIp", "webAccess", "list is read-only");
    EXPECT_EQ(Run("network firewall ruleset allowedip remove -r webAccess -i 2001:db8::5").Errors(),
              Strings{"list is read-only"});
}

// ---------------------------------------------------------------- clients

TEST_F(FirewallRulesetTest, ClientsEnableAndDisableTheRuleset) {
    auto r = Run("network firewall ruleset client get -r webAccess");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "Ruleset Client Count: 1\n");

    StartJournal();
    EXPECT_EQ(Run("network firewall ruleset client add -r ntpClient").status, 0);
    EXPECT_EQ(Journal(), (Strings{"HostCtl::HostFactory::GetHost", "HostCtl::Host::GetSystemInfo",
                                  "TknCtl::System::SystemInfoImpl::GetFirewallRulesetById ntpClient",
                                  "HostCtl::System::FirewallRuleset::IsValid ntpClient",
                                  "HostCtl::System::FirewallRuleset::AddClient ntpClient"}));
    EXPECT_EQ(Ruleset("ntpClient")["enabled"], true);
    EXPECT_EQ(Run("network firewall ruleset client add -r ntpClient").status, 0);
    EXPECT_EQ(Run("--formatter=json network firewall ruleset client get -r ntpClient").out,
              "{\"Ruleset Client Count\":2}\n");

    EXPECT_EQ(Run("network firewall ruleset client remove -r ntpClient").status, 0);
    EXPECT_EQ(Ruleset("ntpClient")["enabled"], true);
    EXPECT_EQ(Run("network firewall ruleset client remove -r ntpClient").status, 0);
    EXPECT_EQ(Ruleset("ntpClient")["enabled"], false);
    EXPECT_EQ(Ruleset("ntpClient")["clientCount"], 0);

    r = Run("network firewall ruleset client remove -r ntpClient");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.Errors(), Strings{"Ruleset 'ntpClient' has no clients"});
    EXPECT_EQ(Ruleset("ntpClient")["clientCount"], 0);
}

TEST_F(FirewallRulesetTest, ClientCommandsRefuseUnknownIdsAndReportFailures) {
    for (const char* verb : {"get", "add", "remove"}) {
        SCOPED_TRACE(verb);
        auto r = Run(std::string("network firewall ruleset client ") + verb + " -r nope");
        EXPECT_EQ(r.status, 1);
        EXPECT_EQ(r.out, "");
        EXPECT_EQ(r.Errors(), Strings{"Invalid Ruleset Id."});
    }
    AddFault("HostCtl::Host::GetSystemInfo", {}, "system information unavailable", 1);
    EXPECT_EQ(Run("network firewall ruleset client get -r webAccess").Errors(),
              Strings{"system information unavailable"});
    AddFault("HostCtl::System::FirewallRuleset::AddClient", "webAccess", "too many clients", 1);
    EXPECT_EQ(Run("network firewall ruleset client add -r webAccess").Errors(), Strings{"too many clients"});
    EXPECT_EQ(Ruleset("webAccess")["clientCount"], 1);
    UnloadModule();
    EXPECT_EQ(Run("network firewall ruleset client remove -r webAccess").Errors(), Strings{kNotLoaded});
}

}  // namespace
}  // namespace Hadro::Test

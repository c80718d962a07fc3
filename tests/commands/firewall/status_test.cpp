// "network firewall get | set | load | refresh | unload".
#include "firewall_test.h"

namespace Hadro::Test {
namespace {

using Strings = std::vector<std::string>;

class FirewallStatusTest : public FirewallTest {};

constexpr const char* kNotLoaded = "The firewall module 'hadrofw' is not loaded";

TEST_F(FirewallStatusTest, GetShowsTheLoadedFirewall) {
    auto r = Run("network firewall get");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "Loaded: true\nEnabled: true\nDefaultAction: DROP\n");
    EXPECT_EQ(Run("--formatter=json network firewall get").out,
              "{\"Loaded\":true,\"Enabled\":true,\"DefaultAction\":\"DROP\"}\n");
    EditFirewall([](nlohmann::json& fw) {
        fw["enabled"] = false;
        fw["defaultAction"] = "PASS";
    });
    EXPECT_EQ(Run("network firewall get").out, "Loaded: true\nEnabled: false\nDefaultAction: PASS\n");
}

TEST_F(FirewallStatusTest, GetWithoutTheModuleAsksNothingElse) {
    UnloadModule();
    StartJournal();
    auto r = Run("network firewall get");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "Loaded: false\nEnabled: false\nDefaultAction: PASS\n");
    EXPECT_EQ(Journal(), Strings{"TknCtl::System::ModuleImpl::Refresh hadrofw"});
}

TEST_F(FirewallStatusTest, GetReportsAFailureOnTwoLines) {
    AddFault("TknCtl::System::SystemInfoImpl::GetFirewallDefaultAction", {}, "firewall daemon not answering");
    auto r = Run("network firewall get");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.err, "Unable to get firewall status.\nfirewall daemon not answering\n");
}

TEST_F(FirewallStatusTest, SetNeedsAParameterBeforeLookingAtTheModule) {
    UnloadModule();
    StartJournal();
    auto r = Run("network firewall set");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.Errors(), Strings{"Need parameter --enabled or --default-action"});
    EXPECT_TRUE(Journal().empty());

    r = Run("network firewall set --enabled false");
    EXPECT_EQ(r.Errors(), Strings{"Firewall module is not loaded"});
    EXPECT_EQ(Journal(), Strings{"TknCtl::System::ModuleImpl::Refresh hadrofw"});
    EXPECT_EQ(Firewall()["enabled"], true);
}

TEST_F(FirewallStatusTest, SetChangesBothInOrder) {
    StartJournal();
    auto r = Run("network firewall set -e false -d true");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(Journal("TknCtl::System::SystemInfoImpl"),
              (Strings{"TknCtl::System::SystemInfoImpl::IsFirewallEnabled",
                       "TknCtl::System::SystemInfoImpl::GetFirewallDefaultAction",
                       "TknCtl::System::SystemInfoImpl::SetFirewallEnabled false",
                       "TknCtl::System::SystemInfoImpl::SetFirewallDefaultAction true"}));
    EXPECT_EQ(Firewall()["enabled"], false);
    EXPECT_EQ(Firewall()["defaultAction"], "PASS");
}

TEST_F(FirewallStatusTest, SetAcceptsTheEnabledFlagInForceSilently) {
    StartJournal();
    auto r = Run("network firewall set --enabled true");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_TRUE(Journal("TknCtl::System::SystemInfoImpl::SetFirewall").empty());
}

TEST_F(FirewallStatusTest, SetRefusesTheDefaultActionInForce) {
    auto r = Run("network firewall set --default-action false");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.Errors(), Strings{"Default action already DROP"});

    // The enabled flag, checked first, is changed and stays changed.
    EditFirewall([](nlohmann::json& fw) { fw["defaultAction"] = "PASS"; });
    StartJournal();
    r = Run("network firewall set --enabled false --default-action true");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"Default action already PASS"});
    EXPECT_EQ(Firewall()["enabled"], false);
    EXPECT_TRUE(Journal("TknCtl::System::SystemInfoImpl::SetFirewallDefaultAction").empty());
}

TEST_F(FirewallStatusTest, SetReportsTheLibrarysMessage) {
    AddFault("TknCtl::System::SystemInfoImpl::SetFirewallEnabled", {}, "filter table locked");
    auto r = Run("network firewall set --enabled false --default-action true");
    EXPECT_EQ(r.Errors(), Strings{"filter table locked"});
    EXPECT_EQ(Firewall()["defaultAction"], "DROP");
}

TEST_F(FirewallStatusTest, LoadBringsTheModuleAndRulesetsBack) {
    UnloadModule();
    StartJournal();
    auto r = Run("network firewall load");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(Journal(), (Strings{"TknCtl::System::ModuleImpl::Load hadrofw false",
                                  "TknCtl::System::SystemInfoImpl::LoadFirewallRulesets"}));
    EXPECT_EQ(Firewall()["moduleLoaded"], true);
    EXPECT_EQ(Firewall()["filtersInstalled"], true);
    EXPECT_EQ(Run("network firewall get").out, "Loaded: true\nEnabled: true\nDefaultAction: DROP\n");

    // On a loaded module it reloads the configuration, which drops the dynamic rules.
    EditFirewall([](nlohmann::json& fw) {
        fw["dynamicRules"] = {
            {{"portType", "dst"}, {"portBegin", 902}, {"direction", "inbound"}, {"protocol", "tcp"}}};
    });
    EXPECT_EQ(Run("network firewall load").status, 0);
    EXPECT_TRUE(Firewall()["dynamicRules"].empty());
}

TEST_F(FirewallStatusTest, LoadStopsWhenTheModuleDoesNotLoad) {
    UnloadModule();
    AddFault("TknCtl::System::ModuleImpl::Load", "hadrofw", "module signature rejected");
    StartJournal();
    auto r = Run("network firewall load");
    EXPECT_EQ(r.Errors(), Strings{"module signature rejected"});
    EXPECT_TRUE(Journal("TknCtl::System::SystemInfoImpl").empty());
    EXPECT_EQ(Firewall()["moduleLoaded"], false);
}

TEST_F(FirewallStatusTest, RefreshKeepsTheDynamicRules) {
    auto before = Firewall()["dynamicRules"];
    ASSERT_EQ(before.size(), 2u);
    StartJournal();
    auto r = Run("network firewall refresh");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(Journal(),
              (Strings{"TknCtl::System::SystemInfoImpl::GetFirewallDynamicRules",
                       "TknCtl::System::SystemInfoImpl::LoadFirewallRulesets",
                       "TknCtl::System::SystemInfoImpl::AddFirewallDynamicRule dst 902-902 inbound tcp",
                       "TknCtl::System::SystemInfoImpl::AddFirewallDynamicRule src 4500-4500 outbound udp"}));
    EXPECT_EQ(Firewall()["dynamicRules"], before);

    EditFirewall([](nlohmann::json& fw) { fw["dynamicRules"] = nlohmann::json::array(); });
    EXPECT_EQ(Run("network firewall refresh").status, 0);
}

TEST_F(FirewallStatusTest, RefreshFailures) {
    // A rule that cannot be put back is lost with the reload; the message says why.
    AddFault("TknCtl::System::SystemInfoImpl::AddFirewallDynamicRule", {}, "rule table full", 1);
    auto r = Run("network firewall refresh");
    EXPECT_EQ(r.Errors(), Strings{"rule table full"});
    EXPECT_TRUE(Firewall()["dynamicRules"].empty());

    UnloadModule();
    EXPECT_EQ(Run("network firewall refresh").Errors(), Strings{kNotLoaded});
}

TEST_F(FirewallStatusTest, UnloadDropsTheFiltersThenTheModuleAndMayBeRepeated) {
    StartJournal();
    auto r = Run("network firewall unload");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(Journal(), (Strings{"TknCtl::System::ModuleImpl::Refresh hadrofw",
                                  "TknCtl::System::SystemInfoImpl::DestroyFirewallFilters",
                                  "TknCtl::System::ModuleImpl::Unload hadrofw"}));
    auto fw = Firewall();
    EXPECT_EQ(fw["moduleLoaded"], false);
    EXPECT_EQ(fw["filtersInstalled"], false);
    EXPECT_TRUE(fw["dynamicRules"].empty());
    // Switches of the configuration outlive the module.
    EXPECT_EQ(fw["enabled"], true);

    StartJournal();
    r = Run("network firewall unload");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(Journal(), Strings{"TknCtl::System::ModuleImpl::Refresh hadrofw"});
    EXPECT_EQ(Run("network firewall get").out, "Loaded: false\nEnabled: false\nDefaultAction: PASS\n");
}

TEST_F(FirewallStatusTest, UnloadFailureLeavesTheModuleLoadedWithoutFilters) {
    AddFault("TknCtl::System::ModuleImpl::Unload", "hadrofw", "module busy");
    auto r = Run("network firewall unload");
    EXPECT_EQ(r.Errors(), Strings{"module busy"});
    EXPECT_EQ(Firewall()["moduleLoaded"], true);
    EXPECT_EQ(Firewall()["filtersInstalled"], false);
    // Reloading the configuration installs the filters again.
    EXPECT_EQ(Run("network firewall refresh").status, 0);
    EXPECT_EQ(Firewall()["filtersInstalled"], true);
}

}  // namespace
}  // namespace Hadro::Test

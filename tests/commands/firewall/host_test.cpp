// The simulated host's firewall rules, through the library directly.
#include <gtest/gtest.h>

#include <functional>
#include <nlohmann/json.hpp>

#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"
#include "hostctl/session.h"
#include "hostctl/system/firewall.h"

namespace {

using HostCtl::Lib::HostCtlException;
using HostCtl::Lib::HostSession;
using HostCtl::System::FirewallRule;
using TknCtl::System::ModuleImpl;
using TknCtl::System::SystemInfoImpl;

// The message of the exception call throws, or "" when it throws none.
template <class Call>
std::string Refusal(Call&& call) {
    try {
        call();
    } catch (const HostCtlException& e) {
        return e.what();
    }
    return "";
}

nlohmann::json DefaultDocument() {
    return nlohmann::json::parse(HostSession::InMemoryDefault()->Export());
}

std::string FirewallOf(const HostSession& session) {
    return nlohmann::json::parse(session.Export())["firewall"].dump();
}

TEST(FirewallHost, ModuleRules) {
    auto session = HostSession::InMemoryDefault();
    ModuleImpl module("hadrofw");
    EXPECT_TRUE(module.IsStale());
    EXPECT_FALSE(module.IsLoaded());
    module.Refresh();
    EXPECT_TRUE(module.IsLoaded());

    EXPECT_EQ(Refusal([&] { module.Load("debug=1", false); }),
              "Cannot load module 'hadrofw': it takes no options (given 'debug=1')");
    EXPECT_EQ(Refusal([&] { ModuleImpl("nosuchmod").Load("", false); }),
              "Cannot load module 'nosuchmod': no such module");
    // In use while its filters are installed.
    EXPECT_EQ(Refusal([&] { module.Unload(); }),
              "Cannot unload module 'hadrofw': it is in use (the firewall filters are still installed)");

    SystemInfoImpl system;
    system.DestroyFirewallFilters();
    module.Unload();
    EXPECT_FALSE(module.IsLoaded());
    EXPECT_EQ(Refusal([&] { module.Unload(); }), "Cannot unload module 'hadrofw': it is not loaded");

    // Loading installs the configuration's filters, with no dynamic rules.
    module.Load("", false);
    EXPECT_TRUE(system.IsFirewallEnabled());
    EXPECT_TRUE(system.GetFirewallDynamicRules().empty());
    FirewallRule rule(FirewallRule::PORT_TYPE_DST, 902, 902, FirewallRule::DIRECTION_INBOUND,
                      FirewallRule::PROTOCOL_TCP);
    system.AddFirewallDynamicRule(rule);
    // A plain load of a loaded module changes nothing; a forced one starts afresh.
    module.Load("", false);
    EXPECT_EQ(system.GetFirewallDynamicRules().size(), 1u);
    module.Load("", true);
    EXPECT_TRUE(system.GetFirewallDynamicRules().empty());
}

TEST(FirewallHost, NothingIsReadOrChangedWithoutTheModule) {
    auto document = DefaultDocument();
    document["firewall"]["moduleLoaded"] = false;
    document["firewall"]["filtersInstalled"] = false;
    document["firewall"]["dynamicRules"] = nlohmann::json::array();
    auto session = HostSession::InMemory(document.dump());
    const std::string before = FirewallOf(*session);
    const std::string notLoaded = "The firewall module 'hadrofw' is not loaded";
    SystemInfoImpl system;
    FirewallRule rule;
    const std::vector<std::function<void()>> calls{
        [&] { system.IsFirewallEnabled(); },        [&] { system.SetFirewallEnabled(false); },
        [&] { system.GetFirewallDefaultAction(); }, [&] { system.SetFirewallDefaultAction(true); },
        [&] { system.GetFirewallRulesets(); },      [&] { system.GetFirewallRulesetById("sshServer"); },
        [&] { system.LoadFirewallRulesets(); },     [&] { system.DestroyFirewallFilters(); },
        [&] { system.GetFirewallDynamicRules(); },  [&] { system.AddFirewallDynamicRule(rule); }};
    for (const auto& call : calls)
        EXPECT_EQ(Refusal(call), notLoaded);
    EXPECT_EQ(FirewallOf(*session), before);
}

TEST(FirewallHost, DynamicRules) {
    auto session = HostSession::InMemoryDefault();
    SystemInfoImpl system;
    auto rules = system.GetFirewallDynamicRules();
    ASSERT_EQ(rules.size(), 2u);
    EXPECT_EQ(*rules[1], FirewallRule(FirewallRule::PORT_TYPE_SRC, 4500, 4500,
                                      FirewallRule::DIRECTION_OUTBOUND, FirewallRule::PROTOCOL_UDP));
    EXPECT_EQ(Refusal([&] { system.AddFirewallDynamicRule(*rules[0]); }),
              "The dynamic rule dst 902-902 inbound tcp is already installed");
    FirewallRule backwards(1, 100, 99, 0, 0);
    EXPECT_EQ(Refusal([&] { system.AddFirewallDynamicRule(backwards); }),
              "Invalid dynamic rule dst 100-99 inbound tcp");
    FirewallRule badProtocol(1, 100, 100, 0, 7);
    EXPECT_EQ(Refusal([&] { system.AddFirewallDynamicRule(badProtocol); }),
              "Invalid dynamic rule dst 100-100 inbound 7");
    FirewallRule tooHigh(1, 100, 70000, 0, 0);
    EXPECT_NE(Refusal([&] { system.AddFirewallDynamicRule(tooHigh); }), "");

    // Reloading the configuration drops them; without filters none can be added.
    system.LoadFirewallRulesets();
    EXPECT_TRUE(system.GetFirewallDynamicRules().empty());
    system.DestroyFirewallFilters();
    EXPECT_EQ(
        Refusal([&] { system.AddFirewallDynamicRule(*rules[0]); }),
        "Cannot add the dynamic rule dst 902-902 inbound tcp: the firewall filters are not installed (load "
        "the ruleset configuration first)");
}

TEST(FirewallHost, AnUnknownRulesetIsReachedButRefusesEverything) {
    auto session = HostSession::InMemoryDefault();
    auto system = HostCtl::HostFactory::GetHost()->GetSystemInfo();
    auto missing = system->GetFirewallRulesetById("nope");
    EXPECT_FALSE(missing->IsValid());
    EXPECT_EQ(Refusal([&] { missing->GetName(); }), "Ruleset 'nope' not found");
    EXPECT_EQ(Refusal([&] { missing->AddClient(); }), "Ruleset 'nope' not found");
}

TEST(FirewallHost, StateFilesKeepTheFirewallConsistent) {
    auto refused = [](const std::function<void(nlohmann::json&)>& edit) {
        auto document = DefaultDocument();
        edit(document["firewall"]);
        try {
            auto session = HostSession::InMemory(document.dump());
            SystemInfoImpl system;
            system.GetFirewallRulesets();
        } catch (const std::exception& e) {
            return std::string(e.what());
        }
        return std::string();
    };
    EXPECT_NE(refused([](nlohmann::json& fw) { fw["rulesets"][2]["allowedIps"].push_back("192.0.2.0/24x"); }),
              "");
    EXPECT_NE(
        refused([](nlohmann::json& fw) { fw["rulesets"][2]["allowedIps"].push_back("2001:DB8:10::200"); }),
        "");
    EXPECT_NE(refused([](nlohmann::json& fw) { fw["rulesets"][2]["clientCount"] = -1; }), "");
    EXPECT_NE(refused([](nlohmann::json& fw) { fw["moduleLoaded"] = false; }), "");
    EXPECT_NE(refused([](nlohmann::json& fw) { fw["dynamicRules"].push_back(fw["dynamicRules"][0]); }), "");
    EXPECT_EQ(refused([](nlohmann::json&) {}), "");
}

}  // namespace

// The firewall of a real host.
//
// The area reads the whole firewall as one value and carries out a change by being given the
// value wanted, which it applies at once (or refuses, changing nothing). The operations
// (TknCtl::System::SystemInfoImpl, ModuleImpl and the rulesets) keep the rules both hosts
// share: the module must be loaded, allowed entries are addresses or networks, clients are
// counted, dynamic rules are well formed and not installed twice.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "hostctl/system/firewall.h"

namespace TknCtl::Backend {

struct FirewallRulesetState {
    std::string name;
    bool enabled = false;
    bool allowedAll = true;
    // The allowed list: addresses and networks in the host's canonical text.
    std::vector<std::string> allowedIps;
    std::vector<HostCtl::System::FirewallRule> rules;
    std::int32_t clients = 0;
};

struct FirewallState {
    bool loaded = false;  // the firewall module is loaded
    bool enabled = false;
    bool pass = true;  // the default action: pass (true) or drop
    std::vector<FirewallRulesetState> rulesets;
    std::vector<HostCtl::System::FirewallRule> dynamicRules;

    FirewallRulesetState* Find(const std::string& name) {
        for (auto& ruleset : rulesets) {
            if (ruleset.name == name) return &ruleset;
        }
        return nullptr;
    }
};

class Firewall {
public:
    virtual ~Firewall();

    // The firewall as the host holds it now; while the module is not loaded, the state it will
    // start in when it is.
    virtual FirewallState Read() = 0;
    // Makes the host hold state (a change of Read's value), or throws HostCtlException saying
    // why it cannot, having changed nothing. Rulesets the host does not know are refused.
    virtual void Write(const FirewallState& state) = 0;
    // Reads the ruleset configuration again: state's rulesets become the configured ones, with
    // the configured rules, each keeping its switches, allowed list and clients.
    virtual void Reconfigure(FirewallState& state) = 0;
};

}  // namespace TknCtl::Backend

// Fixtures shared by the firewall command tests.
#pragma once

#include <nlohmann/json.hpp>

#include "harness.h"

namespace Hadro::Test {

class FirewallTest : public CommandTest {
protected:
    // The firewall section of the host, changed by edit.
    void EditFirewall(const std::function<void(nlohmann::json&)>& edit) {
        EditHost([&](nlohmann::json& document) { edit(document["firewall"]); });
    }
    // A host whose firewall module is not loaded (so no filters and no dynamic rules).
    void UnloadModule() {
        EditFirewall([](nlohmann::json& fw) {
            fw["moduleLoaded"] = false;
            fw["filtersInstalled"] = false;
            fw["dynamicRules"] = nlohmann::json::array();
        });
    }
    nlohmann::json Firewall() const { return Section("firewall"); }
    nlohmann::json Ruleset(const std::string& id) const {
        const auto firewall = Firewall();
        for (const auto& ruleset : firewall["rulesets"]) {
            if (ruleset["id"] == id) return ruleset;
        }
        return nullptr;
    }
};

}  // namespace Hadro::Test

// Fixture of the standard-switch command tests: JSON output and the switch section at hand.
#pragma once

#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "harness.h"

namespace Hadro::Test {

class VswitchTest : public CommandTest {
protected:
    // The command's output with the json formatter.
    nlohmann::json Json(const std::string& commandLine) {
        auto r = Run("--formatter=json " + commandLine);
        EXPECT_EQ(r.status, 0) << commandLine << ": " << r.err;
        return r.out.empty() ? nlohmann::json() : nlohmann::json::parse(r.out);
    }

    // A switch of the host's state, by name.
    nlohmann::json Switch(const std::string& name) const {
        for (const auto& s : Section("vswitches")) {
            if (s["name"] == name) return s;
        }
        return nullptr;
    }

    // The ports of a switch in the host's state.
    std::vector<nlohmann::json> PortsOf(const std::string& switchName) const {
        std::vector<nlohmann::json> ports;
        for (const auto& p : Section("ports")) {
            if (p["switch"] == switchName) ports.push_back(p);
        }
        return ports;
    }

    // Gives vSwitch0 the uplinks vmnic0, vmnic1, vmnic4 in that teaming order with `active`
    // of them active.
    void ThreeUplinks(int active) {
        EditHost([&](nlohmann::json& doc) {
            auto& s = doc["vswitches"][0];
            s["uplinks"] = {"vmnic0", "vmnic1", "vmnic4"};
            s["policy"]["teaming"]["uplinkOrder"] = {"vmnic0", "vmnic1", "vmnic4"};
            s["policy"]["teaming"]["maxActive"] = active;
        });
    }
};

}  // namespace Hadro::Test

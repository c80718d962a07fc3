// Shared fixture of the interface command tests.
#pragma once

#include <nlohmann/json.hpp>

#include <string>
#include <vector>

#include "harness.h"

namespace IpInterfaceTests {

using Strings = std::vector<std::string>;

class IpInterfaceTest : public Hadro::Test::CommandTest {
protected:
    // Runs a command with the json formatter and parses what it printed.
    nlohmann::json Json(const std::string& commandLine) {
        auto r = Run("--formatter=json " + commandLine);
        EXPECT_EQ(r.status, 0) << commandLine << ": " << r.err;
        return r.out.empty() ? nlohmann::json() : nlohmann::json::parse(r.out);
    }

    // The interface record of "network ip interface list" named name, or null.
    nlohmann::json Interface(const std::string& name) {
        for (const auto& nic : Json("network ip interface list")) {
            if (nic["Name"] == name) return nic;
        }
        return nullptr;
    }

    // The element of a section's array whose member key equals value, or null.
    nlohmann::json Find(const std::string& section, const std::string& key, const nlohmann::json& value) {
        for (const auto& item : Section(section)) {
            if (item[key] == value) return item;
        }
        return nullptr;
    }
};

}  // namespace IpInterfaceTests

// Shared pieces of the distributed-switch, port and VM command tests.
#pragma once

#include <nlohmann/json.hpp>

#include <string>

#include "harness.h"

namespace Hadro::Test {

class DvsTest : public CommandTest {
protected:
    // The parsed JSON output of a command line run with --formatter=json; fails the test when
    // the command does not succeed.
    nlohmann::json Json(const std::string& commandLine) {
        auto r = Run("--formatter=json " + commandLine);
        EXPECT_EQ(r.status, 0) << commandLine << ": " << r.err;
        if (r.out.empty()) return nullptr;
        return nlohmann::json::parse(r.out);
    }

    // The first distributed switch of a document, and a port of the ports section by ID.
    static nlohmann::json& Dvs(nlohmann::json& doc) { return doc["dvswitches"][0]; }
    static nlohmann::json& PortById(nlohmann::json& doc, unsigned id) {
        for (auto& port : doc["ports"]) {
            if (port["id"] == id) return port;
        }
        throw std::runtime_error("no port " + std::to_string(id));
    }
};

}  // namespace Hadro::Test

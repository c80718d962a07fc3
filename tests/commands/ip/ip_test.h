// Shared fixture of the IP service command tests.
#pragma once

#include <nlohmann/json.hpp>

#include <string>
#include <vector>

#include "harness.h"

namespace IpTests {

using Strings = std::vector<std::string>;

class IpTest : public Hadro::Test::CommandTest {
protected:
    // Runs a command with the json formatter and parses what it printed.
    nlohmann::json Json(const std::string& commandLine) {
        auto r = Run("--formatter=json " + commandLine);
        EXPECT_EQ(r.status, 0) << commandLine << ": " << r.err;
        return r.out.empty() ? nlohmann::json() : nlohmann::json::parse(r.out);
    }

    // One field of every record a listing prints, joined by blanks, one string per record.
    Strings Rows(const std::string& commandLine, const Strings& fields) {
        Strings rows;
        for (const auto& record : Json(commandLine)) {
            std::string row;
            for (const auto& field : fields) {
                const auto& value = record[field];
                row +=
                    (row.empty() ? "" : " ") + (value.is_string() ? value.get<std::string>() : value.dump());
            }
            rows.push_back(row);
        }
        return rows;
    }
};

}  // namespace IpTests

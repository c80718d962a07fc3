// Running network commands in-process on a fixture host, for command tests.
//
//   class DnsTest : public Hadro::Test::CommandTest {};
//   TEST_F(DnsTest, AddsAServer) {
//       auto r = Run("network ip dns server add --server 10.0.0.9");
//       EXPECT_EQ(r.status, 0);
//       EXPECT_EQ(Run("network ip dns server list").out, "DNS Servers: ...\n");
//   }
//
// Each test starts on an in-memory copy of the default host (or a fixture of its own, see
// UseHost / EditHost); the real network plug-in is loaded once per test program and command
// lines go through the framework's own parser and formatters, as hadrocli does.
#pragma once

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include <nlohmann/json_fwd.hpp>

#include "hostctl/session.h"

namespace Hadro::Test {

struct Result {
    int status = -1;
    std::string out;
    std::string err;
    // The error messages the command added, one per entry (err split at newlines).
    std::vector<std::string> Errors() const;
};

class CommandTest : public ::testing::Test {
protected:
    void SetUp() override;
    void TearDown() override;

    // Replaces the host by a document (JSON text).
    void UseHost(const std::string& document);
    // Changes the host's document before the test runs commands: edit receives the whole
    // document (sections by name) and may change anything; the result is checked as a
    // state file would be.
    void EditHost(const std::function<void(nlohmann::json&)>& edit);

    // Runs one command line. Words are split at blanks; a word may be quoted with '...' or
    // "..." to keep blanks.
    Result Run(const std::string& commandLine);
    Result Run(const std::vector<std::string>& args);

    // The current document, and one section of it.
    std::string Export() const;
    nlohmann::json Section(const std::string& name) const;

    // Faults: a matching host-control call throws HostCtlException(message).
    void AddFault(const std::string& operation, const std::string& target = {}, const std::string& message = {},
                  int count = 0);
    // The journal of host-control calls ("OPERATION TARGET ARGUMENTS"), from now on.
    void StartJournal();
    std::vector<std::string> Journal() const;
    // Journal lines whose operation starts with prefix.
    std::vector<std::string> Journal(const std::string& prefix) const;

    std::unique_ptr<HostCtl::Lib::HostSession> session_;
};

// Splits a command line into words as Run does.
std::vector<std::string> SplitWords(const std::string& commandLine);

}  // namespace Hadro::Test

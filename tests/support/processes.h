// End-to-end tests: the real programs (hadrocli, hadrosim) run as processes on a state file
// of the test's own.
//
//   class NicEndToEnd : public Hadro::Test::EndToEndTest {};
//   TEST_F(NicEndToEnd, DownLasts) {
//       EXPECT_EQ(Cli("network nic down -n vmnic1").status, 0);
//       EXPECT_EQ(Sim("journal show").out, "...");
//   }
//
// Arguments are a shell word list: quote what holds blanks ('VM Network').
#pragma once

#include <gtest/gtest.h>

#include <string>

namespace Hadro::Test {

struct ProcessResult {
    int status = -1;  // exit status; -1 when the program did not end by itself
    std::string out;  // standard output
    std::string err;  // standard error
    // Everything the program printed, standard output first.
    std::string All() const { return out + err; }
};

class EndToEndTest : public ::testing::Test {
protected:
    void SetUp() override;
    void TearDown() override;

    // Runs program --state=STATE arguments, standard input from /dev/null.
    ProcessResult Program(const std::string& program, const std::string& arguments) const;

    // hadrocli with the plug-in of this build; hadrosim. (The paths come from the test
    // program's definitions: see network_command_tests.)
    ProcessResult Cli(const std::string& arguments) const {
        return Program(HADROCLI, std::string("--plugin-dir=") + HADRO_PLUGIN_DIR + " " + arguments);
    }
    ProcessResult Sim(const std::string& arguments) const { return Program(HADROSIM, arguments); }
    // The same, giving the exit status and everything printed.
    int Cli(const std::string& arguments, std::string& all) const {
        auto result = Cli(arguments);
        all = result.All();
        return result.status;
    }
    int Sim(const std::string& arguments, std::string& all) const {
        auto result = Sim(arguments);
        all = result.All();
        return result.status;
    }

    std::string dir_;    // the test's scratch directory, removed after the test
    std::string state_;  // dir_/host.json
};

}  // namespace Hadro::Test

// The firewall commands through the real programs, on a state file of their own.
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

namespace {

struct Outcome {
    int status = -1;
    std::string out;
    std::string err;
};

class FirewallEndToEnd : public ::testing::Test {
protected:
    void SetUp() override {
        char pattern[] = "/tmp/hadro-firewall-XXXXXX";
        ASSERT_NE(mkdtemp(pattern), nullptr);
        dir_ = pattern;
        state_ = dir_ / "host.json";
    }
    void TearDown() override { std::filesystem::remove_all(dir_); }

    // Runs a program with --state and the arguments (already quoted for the shell).
    Outcome Exec(const std::string& program, const std::string& arguments) {
        const auto out = dir_ / "out";
        const auto err = dir_ / "err";
        std::string command = "'" + program + "' --state='" + state_.string() + "' " + arguments + " >'" +
                              out.string() + "' 2>'" + err.string() + "' </dev/null";
        int raw = std::system(command.c_str());
        Outcome outcome;
        outcome.status = WIFEXITED(raw) ? WEXITSTATUS(raw) : -1;
        outcome.out = Slurp(out);
        outcome.err = Slurp(err);
        return outcome;
    }
    Outcome Cli(const std::string& arguments) { return Exec(HADROCLI, arguments); }
    Outcome Sim(const std::string& arguments) { return Exec(HADROSIM, arguments); }

    static std::string Slurp(const std::filesystem::path& path) {
        std::ifstream in(path);
        std::ostringstream text;
        text << in.rdbuf();
        return text.str();
    }

    std::filesystem::path dir_;
    std::filesystem::path state_;
};

TEST_F(FirewallEndToEnd, UnloadLoadAndStatus) {
    auto r = Cli("network firewall unload");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "");
    r = Cli("network firewall get");
    EXPECT_EQ(r.out, "Loaded: false\nEnabled: false\nDefaultAction: PASS\n");
    r = Cli("network firewall set --enabled false");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "Firewall module is not loaded\n");
    r = Cli("network firewall ruleset list");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "The firewall module 'hadrofw' is not loaded\n");

    EXPECT_EQ(Cli("network firewall load").status, 0);
    r = Cli("--formatter=json network firewall get");
    EXPECT_EQ(r.out, "{\"Loaded\":true,\"Enabled\":true,\"DefaultAction\":\"DROP\"}\n");
}

TEST_F(FirewallEndToEnd, AllowedAddressesPersist) {
    EXPECT_EQ(Cli("network firewall ruleset set -r sshServer --allowed-all false").status, 0);
    EXPECT_EQ(Cli("network firewall ruleset allowedip add -r sshServer -i 2001:db8::/48").status, 0);
    EXPECT_EQ(Cli("network firewall ruleset allowedip add -r sshServer -i 192.0.2.10").status, 0);
    auto r = Cli("network firewall ruleset allowedip add -r sshServer -i 192.0.2.10");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "'192.0.2.10' is already on the allowed list of ruleset 'sshServer'\n");
    r = Cli("network firewall ruleset allowedip list -r sshServer");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out,
              "Ruleset    Allowed IP Addresses\n"
              "---------  -------------------------\n"
              "sshServer  192.0.2.10, 2001:db8::/48\n");
    r = Cli("network firewall ruleset allowedip add -r sshServer");
    EXPECT_EQ(r.status, 2);

    ASSERT_EQ(Sim("fault add HostCtl::System::FirewallRuleset::RemoveAllowedIp --target sshServer "
                  "--message 'allowed list is read-only' --count 1")
                  .status,
              0);
    r = Cli("network firewall ruleset allowedip remove -r sshServer -i 192.0.2.10");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "allowed list is read-only\n");
    EXPECT_EQ(Cli("network firewall ruleset allowedip remove -r sshServer -i 192.0.2.10").status, 0);
}

}  // namespace

// Standard switches through the real hadrocli and hadrosim on a state file.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

namespace {

class VswitchEndToEnd : public ::testing::Test {
protected:
    void SetUp() override {
        char dir[] = "/tmp/hadro-vswitch-XXXXXX";
        ASSERT_NE(mkdtemp(dir), nullptr);
        dir_ = dir;
    }
    void TearDown() override { std::filesystem::remove_all(dir_); }

    // Runs a program on the test's state file; returns the exit status and fills out (stdout,
    // then stderr).
    int Exec(const std::string& program, const std::string& args, std::string& out) {
        std::string command = program + " --state=" + dir_ + "/host.json " + args + " 2>&1";
        out.clear();
        FILE* pipe = popen(command.c_str(), "r");
        if (!pipe) return -1;
        char buffer[4096];
        for (std::size_t n; (n = fread(buffer, 1, sizeof buffer, pipe)) > 0;)
            out.append(buffer, n);
        int status = pclose(pipe);
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }
    int Cli(const std::string& args, std::string& out) {
        return Exec(std::string(HADROCLI) + " --plugin-dir=" + HADRO_PLUGIN_DIR, args, out);
    }

    std::string dir_;
};

TEST_F(VswitchEndToEnd, ASwitchIsBuiltAcrossRuns) {
    std::string out;
    ASSERT_EQ(Cli("network vswitch standard add --vswitch-name=lab --ports=32", out), 0) << out;
    ASSERT_EQ(Cli("network vswitch standard uplink add -v lab -u vmnic6", out), 0) << out;
    ASSERT_EQ(Cli("network vswitch standard uplink add -v lab -u vmnic4", out), 0) << out;
    ASSERT_EQ(Cli("network vswitch standard portgroup add -v lab -p Bench", out), 0) << out;
    ASSERT_EQ(Cli("network vswitch standard portgroup set -p Bench -v 42", out), 0) << out;
    ASSERT_EQ(Cli("network vswitch standard policy failover set -v lab -a vmnic4 -s vmnic6", out), 0) << out;

    EXPECT_EQ(Cli("--formatter=table network vswitch standard list -v lab", out), 0);
    EXPECT_NE(out.find("lab   etherswitch  32         2           32"), std::string::npos) << out;
    EXPECT_EQ(Cli("network vswitch standard portgroup policy failover get -p Bench", out), 0);
    EXPECT_NE(out.find("Active Adapters: vmnic4\nStandby Adapters: vmnic6\n"), std::string::npos) << out;

    // The state stays valid as a whole.
    EXPECT_EQ(Exec(HADROSIM, "export > " + dir_ + "/export.json", out), 0) << out;
}

TEST_F(VswitchEndToEnd, RefusalsExitWithTheirMessages) {
    std::string out;
    EXPECT_EQ(Cli("network vswitch standard remove -v vSwitch0", out), 1);
    EXPECT_EQ(
        out,
        "Unable to remove virtual switch vSwitch0: Tarkon interface tkn0 is connected to its port group "
        "Management Network\n");
    EXPECT_EQ(Cli("network vswitch standard add -v lab -P 5000", out), 2);
    EXPECT_EQ(
        Exec(HADROSIM, "fault add HostCtl::Network::PortGroup::SetVlanId --message 'VLAN filter full'", out),
        0);
    EXPECT_EQ(Cli("network vswitch standard portgroup set -p Migration -v 30", out), 1);
    EXPECT_EQ(out, "VLAN filter full\n");
}

}  // namespace

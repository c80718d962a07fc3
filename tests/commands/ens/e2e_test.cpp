// ENS commands through the real hadrocli on a state file.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

namespace {

class EnsEndToEnd : public ::testing::Test {
protected:
    void SetUp() override {
        char dir[] = "/tmp/hadro-ens-XXXXXX";
        ASSERT_NE(mkdtemp(dir), nullptr);
        dir_ = dir;
    }
    void TearDown() override { std::filesystem::remove_all(dir_); }

    // Runs hadrocli on the test's state file; returns the exit status and fills out (stdout
    // and stderr together).
    int Cli(const std::string& args, std::string& out) {
        std::string command = std::string(HADROCLI) + " --state=" + dir_ +
                              "/host.json --plugin-dir=" + HADRO_PLUGIN_DIR + " " + args + " 2>&1";
        out.clear();
        FILE* pipe = popen(command.c_str(), "r");
        if (!pipe) return -1;
        char buffer[4096];
        for (std::size_t n; (n = fread(buffer, 1, sizeof buffer, pipe)) > 0;)
            out.append(buffer, n);
        int status = pclose(pipe);
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }

    std::string dir_;
};

TEST_F(EnsEndToEnd, ContextsLastAcrossRuns) {
    std::string out;
    EXPECT_EQ(Cli("network ens lcore add -l 3", out), 0);
    EXPECT_EQ(Cli("network ens lcore switch add -l 3 -s vSwitch1", out), 0);
    EXPECT_EQ(Cli("network ens lcore affinity set -l 3 -a 1", out), 0);
    EXPECT_EQ(Cli("--formatter=json network ens lcore list", out), 0);
    EXPECT_EQ(out, "[{\"Lcore ID\":3,\"Switch\":\"vSwitch1\",\"Affinity\":1}]\n");
    EXPECT_EQ(Cli("network ens lcore add -l 3", out), 1);
    EXPECT_EQ(out, "false\n");
    EXPECT_EQ(Cli("network ens maxLcores set -n 3", out), 1);
    EXPECT_EQ(out, "The maximum number of ENS contexts cannot be 3: ENS context 3 exists; remove it first\n");
}

}  // namespace

// The IP service commands through the real hadrocli and hadrosim on a state file.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <cstdio>
#include <filesystem>
#include <string>

namespace {

class IpEndToEnd : public ::testing::Test {
protected:
    void SetUp() override {
        char dir[] = "/tmp/hadro-ip-XXXXXX";
        ASSERT_NE(mkdtemp(dir), nullptr);
        dir_ = dir;
    }
    void TearDown() override { std::filesystem::remove_all(dir_); }

    struct Outcome {
        int status = -1;
        std::string out;
        std::string err;
    };

    Outcome Exec(const std::string& program, const std::string& args) {
        const std::string errFile = dir_ + "/stderr";
        std::string command = program + " --state=" + dir_ + "/host.json " + args + " 2>" + errFile;
        Outcome outcome;
        FILE* pipe = popen(command.c_str(), "r");
        outcome.out = Read(pipe);
        int status = pclose(pipe);
        outcome.status = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
        FILE* file = std::fopen(errFile.c_str(), "r");
        outcome.err = Read(file);
        if (file) std::fclose(file);
        return outcome;
    }
    Outcome Cli(const std::string& args) {
        return Exec(HADROCLI, std::string("--plugin-dir=") + HADRO_PLUGIN_DIR + " " + args);
    }
    Outcome Sim(const std::string& args) { return Exec(HADROSIM, args); }

    std::string dir_;

private:
    static std::string Read(FILE* file) {
        std::string text;
        if (!file) return text;
        char buffer[4096];
        for (std::size_t n; (n = std::fread(buffer, 1, sizeof buffer, file)) > 0;)
            text.append(buffer, n);
        return text;
    }
};

TEST_F(IpEndToEnd, ChangesLastAcrossRuns) {
    ASSERT_EQ(Cli("network ip dns search add --domain corp.example.org").status, 0);
    ASSERT_EQ(Cli("network ip route ipv4 add -n 10.0.0.0/8 -g 192.0.2.254").status, 0);
    ASSERT_EQ(Cli("network ip set -e false").status, 0);
    EXPECT_EQ(Cli("network ip dns search list").out,
              "DNS Search Domains: lab.example.com, example.com, corp.example.org\n");
    auto r = Cli("--formatter=json network ip route ipv4 list");
    EXPECT_NE(
        r.out.find(
            R"({"Network":"10.0.0.0","Netmask":"255.0.0.0","Gateway":"192.0.2.254","Interface":"tkn0","Source":"MANUAL"})"),
        std::string::npos)
        << r.out;
    EXPECT_EQ(Cli("network ip get").out, "IPv6 Enabled: false\n");
    EXPECT_EQ(Cli("--formatter=json network ip neighbor list -v 6").out, "[]\n");
}

TEST_F(IpEndToEnd, FailuresAreReportedOnStderr) {
    auto r = Cli("network ip route ipv4 remove -n default -g 192.0.2.77");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "192.0.2.77 is not a default route.\n");
    ASSERT_EQ(Sim("fault add TknCtl::Network::NetworkInfoImpl::GetCurrentUdpTarkonConnections --message "
                  "'stack busy'")
                  .status,
              0);
    r = Cli("network ip connection list");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "Unable to get connection list.\nstack busy\n");
    EXPECT_EQ(r.out, "");
}

}  // namespace

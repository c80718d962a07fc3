// The distributed-switch commands through the real hadrocli and hadrosim on a state file.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

namespace {

class DvsEndToEnd : public ::testing::Test {
protected:
    void SetUp() override {
        char dir[] = "/tmp/hadro-dvs-XXXXXX";
        ASSERT_NE(mkdtemp(dir), nullptr);
        dir_ = dir;
    }
    void TearDown() override { std::filesystem::remove_all(dir_); }

    // Runs a program on the test's state file; returns its exit status, fills out with stdout
    // and err with stderr.
    int Exec(const std::string& program, const std::string& args, std::string& out, std::string& err) {
        const std::string errFile = dir_ + "/stderr";
        std::string command = program + " --state=" + dir_ + "/host.json " + args + " 2>" + errFile;
        out = Read(popen(command.c_str(), "r"), true);
        FILE* file = std::fopen(errFile.c_str(), "r");
        err = Read(file, false);
        return status_;
    }
    int Cli(const std::string& args, std::string& out, std::string& err) {
        return Exec(HADROCLI, std::string("--plugin-dir=") + HADRO_PLUGIN_DIR + " " + args, out, err);
    }

    std::string dir_;

private:
    std::string Read(FILE* file, bool pipe) {
        std::string text;
        if (!file) return text;
        char buffer[4096];
        for (std::size_t n; (n = fread(buffer, 1, sizeof buffer, file)) > 0;)
            text.append(buffer, n);
        if (pipe) {
            int status = pclose(file);
            status_ = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
        } else {
            std::fclose(file);
        }
        return text;
    }
    int status_ = -1;
};

TEST_F(DvsEndToEnd, TimeoutLastsAcrossRuns) {
    std::string out, err;
    EXPECT_EQ(Cli("network vswitch dvs talvex lacp timeout set -t true -n vmnic3 -l 1 -s dvs-prod", out, err),
              0)
        << err;
    EXPECT_EQ(out, "");
    EXPECT_EQ(Cli("--formatter=table network vswitch dvs talvex lacp status get", out, err), 0) << err;
    EXPECT_NE(
        out.find("Flags: FA, Admin Key: 3, Oper Key: 3, Port Priority: 255, Port Number: 1, Port State: "
                 "ACT,FTO,AGG,SYN,COL,DIST,"),
        std::string::npos)
        << out;
    EXPECT_NE(out.find("Flags: SA, Admin Key: 3, Oper Key: 3, Port Priority: 255, Port Number: 2"),
              std::string::npos)
        << out;

    EXPECT_EQ(Cli("network vswitch dvs talvex lacp timeout set -t true -n vmnic9 -l 1 -s dvs-prod", out, err),
              1);
    EXPECT_EQ(err, "NIC vmnic9 is not a member of LAG 1 on distributed switch dvs-prod\n");
    EXPECT_EQ(Cli("network vswitch dvs talvex lacp timeout set -t maybe -l 1 -s dvs-prod", out, err), 2);
}

TEST_F(DvsEndToEnd, ListingsAndInjectedFailures) {
    std::string out, err;
    EXPECT_EQ(Cli("network vm list", out, err), 0) << err;
    EXPECT_EQ(out.substr(0, out.find('\n')), "World ID  Name    Num Ports  Networks");
    EXPECT_EQ(Cli("network vswitch dvs talvex list --qbr-name nope", out, err), 1);
    EXPECT_EQ(out, "");
    EXPECT_EQ(err, "Unable to access all qBR\n");

    EXPECT_EQ(
        Exec(HADROSIM, "fault add HostCtl::Network::Port::GetPacketStats --message 'stats locked'", out, err),
        0)
        << err;
    EXPECT_EQ(Cli("network port stats get -p 33554437", out, err), 1);
    EXPECT_EQ(err, "Unable to get stats for port: stats locked\n");
}

TEST_F(DvsEndToEnd, HelpShowsTheParameters) {
    std::string out, err;
    EXPECT_EQ(Cli("--formatter=json network vswitch dvs talvex lacp timeout set --help", out, err), 0) << err;
    EXPECT_NE(
        out.find(R"("parameters":[{"name":"timeout","short":"t","type":"boolean","required":true,)"
                 R"("description":"Set long or short timeout: 1 for short timeout and 0 for long timeout."},)"
                 R"({"name":"nic-name","short":"n","type":"string","required":false,)"
                 R"("description":"The nic name. If it is set, then only this vmnic in the lag will be )"
                 R"(configured."},{"name":"lag-id","short":"l","type":"integer","required":true,)"
                 R"("description":"The ID of LAG to be configured."},{"name":"qbr","short":"s",)"
                 R"("type":"string","required":true,"description":"The name of QBR."}])"),
        std::string::npos)
        << out;
    EXPECT_NE(out.find(R"("metadata":{},"formatter":"")"), std::string::npos) << out;
}

}  // namespace

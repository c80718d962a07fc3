// The NIC commands through the real programs, on a temporary state file.
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <nlohmann/json.hpp>
#include <string>

namespace {

using nlohmann::json;

struct Process {
    int status = -1;
    std::string out;
};

class NicEndToEnd : public ::testing::Test {
protected:
    void SetUp() override {
        char pattern[] = "/tmp/nic-e2e-XXXXXX";
        ASSERT_NE(mkdtemp(pattern), nullptr);
        dir_ = pattern;
        state_ = dir_ + "/host.json";
        ASSERT_EQ(Sim("reset").status, 0);
    }
    void TearDown() override { std::filesystem::remove_all(dir_); }

    static Process Shell(const std::string& command) {
        Process p;
        FILE* pipe = popen((command + " 2>&1").c_str(), "r");
        if (!pipe) return p;
        char buffer[4096];
        for (std::size_t n; (n = fread(buffer, 1, sizeof buffer, pipe)) > 0;)
            p.out.append(buffer, n);
        const int raw = pclose(pipe);
        p.status = WIFEXITED(raw) ? WEXITSTATUS(raw) : -1;
        return p;
    }
    Process Cli(const std::string& arguments) {
        return Shell(std::string(HADROCLI) + " --state=" + state_ + " --plugin-dir=" + HADRO_PLUGIN_DIR +
                     " " + arguments);
    }
    Process Sim(const std::string& arguments) {
        return Shell(std::string(HADROSIM) + " --state=" + state_ + " " + arguments);
    }

    std::string dir_;
    std::string state_;
};

TEST_F(NicEndToEnd, DownIsKeptInTheStateFile) {
    auto down = Cli("network nic down --nic-name vmnic1");
    EXPECT_EQ(down.status, 0) << down.out;
    EXPECT_EQ(down.out, "");
    auto list = Cli("--formatter=json network nic list");
    ASSERT_EQ(list.status, 0) << list.out;
    auto nics = json::parse(list.out);
    EXPECT_EQ(nics[1]["Admin Status"], "Down");
    EXPECT_EQ(nics[1]["Link Status"], "Down");
    EXPECT_EQ(nics[0]["Admin Status"], "Up");

    auto refused = Cli("network nic set -n vmnic1 -w d");
    EXPECT_EQ(refused.status, 1);
    EXPECT_EQ(refused.out, "Invalid wol value.\n");
    auto unknown = Cli("network nic ring current set -n vmnic1 --rx many");
    EXPECT_EQ(unknown.status, 2);
}

TEST_F(NicEndToEnd, FaultsAndTheJournalReachTheCommands) {
    ASSERT_EQ(Sim("fault add HostCtl::Network::Pnic::GetCoalesceParams --target vmnic0 --message 'bus error'")
                  .status,
              0);
    auto coalesce = Cli("--formatter=json network nic coalesce get");
    ASSERT_EQ(coalesce.status, 0) << coalesce.out;
    EXPECT_EQ(json::parse(coalesce.out)[0]["RX microseconds"], "N/A");
    auto low = Cli("network nic coalesce low get -n vmnic0");
    EXPECT_EQ(low.status, 1);
    EXPECT_EQ(low.out, "bus error\n");

    ASSERT_EQ(Sim("journal on").status, 0);
    EXPECT_EQ(Cli("network nic software set -n vmnic1 --sg true").status, 0);
    auto journal = Sim("journal show");
    EXPECT_NE(journal.out.find("HostCtl::Network::Pnic::SetSoftwareSettings vmnic1 mask=0x4 sg=true"),
              std::string::npos)
        << journal.out;
}

TEST_F(NicEndToEnd, HelpShowsTheDeclaredParameters) {
    auto help = Cli("--formatter=json network nic set --help");
    ASSERT_EQ(help.status, 0) << help.out;
    auto doc = json::parse(help.out);
    EXPECT_EQ(doc["description"], "Set the general options for the specified ethernet device.");
    ASSERT_EQ(doc["parameters"].size(), 10u);
    EXPECT_EQ(doc["parameters"][5]["name"], "wake-on-lan");
    EXPECT_EQ(doc["parameters"][5]["constraint"], json::parse(R"({"kind":"regex","pattern":"[pumbagsd]+"})"));
    EXPECT_EQ(doc["parameters"][7]["short"], "S");
    EXPECT_EQ(doc["parameters"][7]["constraint"]["values"].size(), 12u);
    EXPECT_EQ(doc["parameters"][9]["type"], "flag");

    auto software = json::parse(Cli("--formatter=json network nic software set --help").out);
    ASSERT_EQ(software["parameters"].size(), 15u);
    EXPECT_EQ(software["parameters"][6]["name"], "geneveoffload");
    EXPECT_EQ(software["parameters"][6]["type"], "boolean");
}

TEST_F(NicEndToEnd, EepromFromAFileAndVirtualFunctions) {
    const std::string image = dir_ + "/eeprom.bin";
    FILE* file = fopen(image.c_str(), "wb");
    ASSERT_NE(file, nullptr);
    fwrite("\xde\xad\xbe\xef", 1, 4, file);
    fclose(file);
    auto change = Cli("network nic eeprom change -n vmnic1 -m 1212436037 -f " + image);
    EXPECT_EQ(change.status, 0) << change.out;
    auto dump = Cli("--formatter=json network nic eeprom dump -n vmnic1 -l 4");
    ASSERT_EQ(dump.status, 0) << dump.out;
    EXPECT_EQ(json::parse(dump.out), json::parse(R"([{"Offset":"0000","Value":"de ad be ef "}])"));
    const std::string link = dir_ + "/link.bin";
    ASSERT_EQ(symlink(image.c_str(), link.c_str()), 0);
    auto refused = Cli("network nic eeprom change -n vmnic1 -m 1212436037 -f " + link);
    EXPECT_EQ(refused.status, 1);
    EXPECT_EQ(refused.out, "Cannot use EEPROM file " + link + ": it is a symbolic link\n");

    auto vfs = Cli("network sriovnic vf list -n vmnic5");
    EXPECT_EQ(vfs.status, 0);
    EXPECT_EQ(vfs.out.substr(0, vfs.out.find('\n')), "VF ID  Active  PCI Address   Owner World ID");
    auto stats = Cli("network sriovnic vf stats -n vmnic5 -v 7");
    EXPECT_EQ(stats.status, 1);
    EXPECT_EQ(stats.out, "Unable to get VF Stats. Error:vmnic5 has no VF 7\n");
}

}  // namespace

// The NIC commands through the real programs, on a temporary state file.
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <nlohmann/json.hpp>
#include <string>

#include "processes.h"

namespace {

using nlohmann::json;

class NicEndToEnd : public Hadro::Test::EndToEndTest {
protected:
    void SetUp() override {
        EndToEndTest::SetUp();
        ASSERT_EQ(Sim("reset").status, 0);
    }
};

TEST_F(NicEndToEnd, DownIsKeptInTheStateFile) {
    auto down = Cli("network nic down --nic-name vmnic1");
    EXPECT_EQ(down.status, 0) << down.All();
    EXPECT_EQ(down.All(), "");
    auto list = Cli("--formatter=json network nic list");
    ASSERT_EQ(list.status, 0) << list.All();
    auto nics = json::parse(list.All());
    EXPECT_EQ(nics[1]["Admin Status"], "Down");
    EXPECT_EQ(nics[1]["Link Status"], "Down");
    EXPECT_EQ(nics[0]["Admin Status"], "Up");

    auto refused = Cli("network nic set -n vmnic1 -w d");
    EXPECT_EQ(refused.status, 1);
    EXPECT_EQ(refused.All(), "Invalid wol value.\n");
    auto unknown = Cli("network nic ring current set -n vmnic1 --rx many");
    EXPECT_EQ(unknown.status, 2);
}

TEST_F(NicEndToEnd, FaultsAndTheJournalReachTheCommands) {
    ASSERT_EQ(Sim("fault add HostCtl::Network::Pnic::GetCoalesceParams --target vmnic0 --message 'bus error'")
                  .status,
              0);
    auto coalesce = Cli("--formatter=json network nic coalesce get");
    ASSERT_EQ(coalesce.status, 0) << coalesce.All();
    EXPECT_EQ(json::parse(coalesce.All())[0]["RX microseconds"], "N/A");
    auto low = Cli("network nic coalesce low get -n vmnic0");
    EXPECT_EQ(low.status, 1);
    EXPECT_EQ(low.All(), "bus error\n");

    ASSERT_EQ(Sim("journal on").status, 0);
    EXPECT_EQ(Cli("network nic software set -n vmnic1 --sg true").status, 0);
    auto journal = Sim("journal show");
    EXPECT_NE(journal.All().find("HostCtl::Network::Pnic::SetSoftwareSettings vmnic1 mask=0x4 sg=true"),
              std::string::npos)
        << journal.All();
}

TEST_F(NicEndToEnd, HelpShowsTheDeclaredParameters) {
    auto help = Cli("--formatter=json network nic set --help");
    ASSERT_EQ(help.status, 0) << help.All();
    auto doc = json::parse(help.All());
    EXPECT_EQ(doc["description"], "Set the general options for the specified ethernet device.");
    ASSERT_EQ(doc["parameters"].size(), 10u);
    EXPECT_EQ(doc["parameters"][5]["name"], "wake-on-lan");
    EXPECT_EQ(doc["parameters"][5]["constraint"], json::parse(R"({"kind":"regex","pattern":"[pumbagsd]+"})"));
    EXPECT_EQ(doc["parameters"][7]["short"], "S");
    EXPECT_EQ(doc["parameters"][7]["constraint"]["values"].size(), 12u);
    EXPECT_EQ(doc["parameters"][9]["type"], "flag");

    auto software = json::parse(Cli("--formatter=json network nic software set --help").All());
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
    EXPECT_EQ(change.status, 0) << change.All();
    auto dump = Cli("--formatter=json network nic eeprom dump -n vmnic1 -l 4");
    ASSERT_EQ(dump.status, 0) << dump.All();
    EXPECT_EQ(json::parse(dump.All()), json::parse(R"([{"Offset":"0000","Value":"de ad be ef "}])"));
    const std::string link = dir_ + "/link.bin";
    ASSERT_EQ(symlink(image.c_str(), link.c_str()), 0);
    auto refused = Cli("network nic eeprom change -n vmnic1 -m 1212436037 -f " + link);
    EXPECT_EQ(refused.status, 1);
    EXPECT_EQ(refused.All(), "Cannot use EEPROM file " + link + ": it is a symbolic link\n");

    auto vfs = Cli("network sriovnic vf list -n vmnic5");
    EXPECT_EQ(vfs.status, 0);
    EXPECT_EQ(vfs.All().substr(0, vfs.All().find('\n')), "VF ID  Active  PCI Address   Owner World ID");
    auto stats = Cli("network sriovnic vf stats -n vmnic5 -v 7");
    EXPECT_EQ(stats.status, 1);
    EXPECT_EQ(stats.All(), "Unable to get VF Stats. Error:vmnic5 has no VF 7\n");
}

}  // namespace

// "network nic" statistics, VLAN statistics, register and EEPROM dumps, EEPROM changes, self
// test and negotiation restart on fixture hosts.
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>

#include "harness.h"

namespace {

using nlohmann::json;

class NicDiagTest : public Hadro::Test::CommandTest {
protected:
    void TearDown() override {
        if (!dir_.empty()) std::filesystem::remove_all(dir_);
        CommandTest::TearDown();
    }
    json Json(const std::string& commandLine) {
        auto r = Run("--formatter=json " + commandLine);
        EXPECT_EQ(r.status, 0) << commandLine << ": " << r.err;
        return r.out.empty() ? json() : json::parse(r.out);
    }
    std::string Error(const std::string& commandLine) {
        auto r = Run(commandLine);
        EXPECT_EQ(r.status, 1) << commandLine;
        EXPECT_EQ(r.out, "") << commandLine;
        auto errors = r.Errors();
        EXPECT_EQ(errors.size(), 1u) << commandLine << ": " << r.err;
        return errors.empty() ? std::string() : errors.front();
    }
    json Nic(const std::string& name) {
        for (const auto& nic : Section("pnics"))
            if (nic["name"] == name) return nic;
        return json();
    }
    void EditNic(const std::string& name, const std::function<void(json&)>& edit) {
        EditHost([&](json& doc) {
            for (auto& nic : doc["pnics"])
                if (nic["name"] == name) edit(nic);
        });
    }
    // Bytes 0, 1, 2, ... as the hexadecimal text the state keeps.
    static std::string Counting(std::size_t count) {
        static const char digits[] = "0123456789abcdef";
        std::string text;
        for (std::size_t i = 0; i < count; ++i) {
            text += digits[(i >> 4) & 0xf];
            text += digits[i & 0xf];
        }
        return text;
    }
    static json Line(const std::string& offset, const std::string& value) {
        return {{"Offset", offset}, {"Value", value}};
    }
    // A file in a private temporary directory.
    std::string File(const std::string& name, const std::string& content) {
        if (dir_.empty()) {
            char pattern[] = "/tmp/nic-diag-XXXXXX";
            EXPECT_NE(mkdtemp(pattern), nullptr);
            dir_ = pattern;
        }
        const std::string path = dir_ + "/" + name;
        std::ofstream(path, std::ios::binary) << content;
        return path;
    }
    std::string dir_;
};

// ---------------------------------------------------------------- statistics

TEST_F(NicDiagTest, StatsGet) {
    auto list = Json("network nic stats get -n vmnic5");
    ASSERT_EQ(list.size(), 1u);
    EXPECT_EQ(list[0]["NIC Name"], "vmnic5");
    EXPECT_EQ(list[0]["Packets received"], 921101555);
    EXPECT_EQ(list[0]["Bytes received"], 563714151660);
    EXPECT_EQ(list[0]["Receive CRC errors"], 10);
    EXPECT_EQ(list[0].size(), 24u);
    auto simple = Run("network nic stats get -n vmnic5");
    EXPECT_EQ(simple.out.substr(0, simple.out.find('\n', simple.out.find('\n') + 1)),
              "NIC statistics for vmnic5\n   Packets received: 921101555");

    // Counters are unsigned 64-bit: 2^63 and more are shown as they are, in every formatter.
    EditNic("vmnic6", [](json& nic) {
        nic["stats"]["txWindowErrors"] = 18446744073709551615ull;
        nic["stats"]["rxPackets"] = 9223372036854775808ull;
    });
    EXPECT_EQ(Json("network nic stats get -n vmnic6")[0]["Transmit window errors"], 18446744073709551615ull);
    for (const char* formatter : {"simple", "table", "json", "xml", "csv", "keyvalue"}) {
        const auto out =
            Run(std::string("--formatter=") + formatter + " network nic stats get -n vmnic6").out;
        EXPECT_NE(out.find("18446744073709551615"), std::string::npos) << formatter << ":\n" << out;
        EXPECT_NE(out.find("9223372036854775808"), std::string::npos) << formatter << ":\n" << out;
        EXPECT_EQ(out.find("-1"), std::string::npos) << formatter << ":\n" << out;
        EXPECT_EQ(out.find("-9"), std::string::npos) << formatter << ":\n" << out;
    }
    EXPECT_EQ(Error("network nic stats get -n vmnic9"),
              "Unable to get stats for NIC: Physical NIC vmnic9 does not exist");
    AddFault("TknCtl::Network::PnicImpl::GetPnicStats", "vmnic0", "counters frozen");
    EXPECT_EQ(Error("network nic stats get -n vmnic0"), "Unable to get stats for NIC: counters frozen");
}

// ---------------------------------------------------------------- VLAN statistics

TEST_F(NicDiagTest, VlanStatsFollowTheSwitchOfTheUplink) {
    EXPECT_EQ(Json("network nic vlan stats get -n vmnic3"),
              json::parse(R"([{"VLAN ID":110,"Packets received":771204,"Packets sent":650012},
                              {"VLAN ID":120,"Packets received":120938,"Packets sent":99812}])"));
    EXPECT_EQ(Run("network nic vlan stats get -n vmnic0").out,
              "VLAN 0\n   Packets received: 9021331\n   Packets sent: 7733820\n");
    // The uplink of the second switch.
    EXPECT_EQ(Error("network nic vlan stats get -n vmnic2"),
              "VLAN stats are disabled for vmnic2 please enable them first.");
    StartJournal();
    EXPECT_EQ(Json("network nic vlan stats set -n vmnic2 -e true"), true);
    EXPECT_EQ(
        Journal("HostCtl::Network::Portset::SetVlanStatsEnabled"),
        std::vector<std::string>{"HostCtl::Network::Portset::SetVlanStatsEnabled vSwitch1 vmnic2 true"});
    // Collection starts at zero for the VLANs of the switch's port groups.
    EXPECT_EQ(Json("network nic vlan stats get -n vmnic2"),
              json::parse(R"([{"VLAN ID":20,"Packets received":0,"Packets sent":0}])"));
    // Without "enabled" the collection is switched off.
    EXPECT_EQ(Json("network nic vlan stats set -n vmnic3"), true);
    EXPECT_EQ(Error("network nic vlan stats get -n vmnic3"),
              "VLAN stats are disabled for vmnic3 please enable them first.");
    EXPECT_EQ(Json("network nic vlan stats set -n vmnic3 -e yes"), true);
    EXPECT_EQ(Json("network nic vlan stats get -n vmnic3").size(), 2u);  // the counters were kept

    // A NIC on no switch, and one that does not exist.
    EXPECT_EQ(Error("network nic vlan stats get -n vmnic4"),
              "vmnic4 is not a valid NIC connected to any virtual switch.");
    EXPECT_EQ(Error("network nic vlan stats set -n vmnic9 -e true"),
              "vmnic9 is not a valid NIC connected to any virtual switch.");
    EXPECT_EQ(Error("network nic vlan stats get -n VMNIC0"),
              "VMNIC0 is not a valid NIC connected to any virtual switch.");
}

TEST_F(NicDiagTest, VlanStatsFailures) {
    AddFault("HostCtl::Network::Portset::GetVlanStats", "vSwitch0", "stats table busy");
    EXPECT_EQ(Error("network nic vlan stats get -n vmnic1"), "Unable to get VLAN stats: stats table busy");
    AddFault("HostCtl::Network::Portset::SetVlanStatsEnabled", "vSwitch0", "stats table locked");
    EXPECT_EQ(Error("network nic vlan stats set -n vmnic1 -e true"),
              "Unable to set VLAN stats: stats table locked");
    AddFault("TknCtl::Network::VirtualSwitchInfoImpl::GetAllSwitches", "", "no switches");
    EXPECT_EQ(Error("network nic vlan stats get -n vmnic1"), "Unable to get VLAN stats: no switches");
    EXPECT_EQ(Error("network nic vlan stats set -n vmnic1"), "Unable to set VLAN stats: no switches");
}

// ---------------------------------------------------------------- dumps

TEST_F(NicDiagTest, RegisterDumpLines) {
    EditNic("vmnic0", [](json& nic) { nic["registers"] = Counting(16); });
    EXPECT_EQ(Json("network nic register dump -n vmnic0"),
              json::array({Line("0000", "00 01 02 03 04 05 06 07 08 09 0a 0b 0c 0d 0e 0f ")}));
    EditNic("vmnic0", [](json& nic) { nic["registers"] = ""; });
    EXPECT_EQ(Json("network nic register dump -n vmnic0"), json::array({Line("0000", "")}));
    EditNic("vmnic0", [](json& nic) { nic["registers"] = Counting(18); });
    EXPECT_EQ(Json("network nic register dump -n vmnic0"),
              json::array({Line("0000", "00 01 02 03 04 05 06 07 08 09 0a 0b 0c 0d 0e 0f "),
                           Line("0010", "10 11 ")}));
    EXPECT_EQ(Json("network nic register dump -n vmnic1").size(), 6u);  // 96 bytes

    EXPECT_EQ(Error("network nic register dump -n vmnic9"), "Pnic with name vmnic9 not found");
    EXPECT_EQ(Error("network nic register dump -n vmnic4"),
              "vmnic4 does not support register dumps (driver usbnet)");
    AddFault("HostCtl::Network::Pnic::GetRegisterDump", "vmnic1", "bus error");
    EXPECT_EQ(Error("network nic register dump -n vmnic1"), "bus error");
}

TEST_F(NicDiagTest, EepromDumpLines) {
    EditNic("vmnic0", [](json& nic) { nic["eeprom"]["data"] = Counting(128); });
    // An unaligned start: blanks for the positions before it, then the rest of that block.
    EXPECT_EQ(Json("network nic eeprom dump -n vmnic0 --offset 19 --length 40"),
              json::array({Line("0010", "         13 14 15 16 17 18 19 1a 1b 1c 1d 1e 1f "),
                           Line("0020", "20 21 22 23 24 25 26 27 28 29 2a 2b 2c 2d 2e 2f "),
                           Line("0030", "30 31 32 33 34 35 36 37 38 39 3a ")}));
    EXPECT_EQ(Json("network nic eeprom dump -n vmnic0 -o 5 -l 2"),
              json::array({Line("0000", "               05 06 ")}));
    // Without a length the dump runs to the end; beyond the end it is cut.
    EXPECT_EQ(Json("network nic eeprom dump -n vmnic0").size(), 8u);
    EXPECT_EQ(Json("network nic eeprom dump -n vmnic0 -o 120 -l 100"),
              json::array({Line("0070", "                        78 79 7a 7b 7c 7d 7e 7f ")}));

    EXPECT_EQ(Error("network nic eeprom dump -n vmnic0 -o 128"),
              "Offset 128 is outside the EEPROM of vmnic0 (128 bytes)");
    EXPECT_EQ(Error("network nic eeprom dump -n vmnic0 -o -1"),
              "Offset -1 is outside the EEPROM of vmnic0 (128 bytes)");
    EXPECT_EQ(Error("network nic eeprom dump -n vmnic0 -l -4"), "Invalid EEPROM length -4");
    EXPECT_EQ(Error("network nic eeprom dump -n vmnic9"), "Pnic with name vmnic9 not found");
    EXPECT_EQ(Error("network nic eeprom dump -n vmnic4"),
              "vmnic4 does not support EEPROM access (driver usbnet)");
    AddFault("HostCtl::Network::Pnic::GetEepromDump", "vmnic0", "EEPROM busy");
    EXPECT_EQ(Error("network nic eeprom dump -n vmnic0 -o 4"), "EEPROM busy");
}

TEST_F(NicDiagTest, DumpOffsetsPastFourDigits) {
    EditNic("vmnic0", [](json& nic) { nic["eeprom"]["data"] = Counting(0x10020); });
    EXPECT_EQ(Json("network nic eeprom dump -n vmnic0 -o 65528 -l 24"),
              json::array({Line("fff0", "                        f8 f9 fa fb fc fd fe ff "),
                           Line("10000", "00 01 02 03 04 05 06 07 08 09 0a 0b 0c 0d 0e 0f ")}));
}

// ---------------------------------------------------------------- EEPROM changes

TEST_F(NicDiagTest, EepromChangeParameterRules) {
    EXPECT_EQ(Error("network nic eeprom change -n vmnic0 -v 1"),
              "Need to specify atleast one of --offset, --value or --file");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic0 -o 1"),
              "Need to specify atleast one of --offset, --value or --file");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic0 -m 1212436036"),
              "Need to specify atleast one of --offset, --value or --file");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic0 -f /tmp/x -v 1"),
              "Parameter --file can't be specified together with --offset and --value");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic0 -f /tmp/x -o 1 -v 1"),
              "Parameter --file can't be specified together with --offset and --value");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic9 -o 0 -v 1"), "Pnic with name vmnic9 not found");
}

TEST_F(NicDiagTest, EepromChangeWritesADoubleWord) {
    StartJournal();
    EXPECT_EQ(Json("network nic eeprom change -n vmnic0 -m 1212436036 -o 4 -v 287454020"), true);
    EXPECT_EQ(Json("network nic eeprom dump -n vmnic0 -l 16")[0]["Value"],
              "44 20 82 3c 44 33 22 11 6b 30 f9 0e c7 dd 01 e4 ");
    EXPECT_EQ(
        Journal("HostCtl::Network::Pnic::SetEepromValue"),
        std::vector<std::string>{"HostCtl::Network::Pnic::SetEepromValue vmnic0 offset=4 value=0x11223344"});
    EXPECT_EQ(Json("network nic eeprom change -n vmnic0 -m 1212436036 -o 124 -v 4294967295"), true);

    EXPECT_EQ(Error("network nic eeprom change -n vmnic0 -o 4 -v 1"),
              "Wrong magic key 0 for the EEPROM of vmnic0 (128 bytes)");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic0 -m 1212436037 -o 4 -v 1"),
              "Wrong magic key 1212436037 for the EEPROM of vmnic0 (128 bytes)");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic0 -m 1212436036 -o 125 -v 1"),
              "Offset 125 is outside the EEPROM of vmnic0 (128 bytes): a double word needs 4 bytes");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic0 -m 1212436036 -o -4 -v 1"),
              "Offset -4 is outside the EEPROM of vmnic0 (128 bytes): a double word needs 4 bytes");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic0 -m 1212436036 -o 0 -v 4294967296"),
              "EEPROM value 4294967296 does not fit in a double word");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic4 -m 1212436040 -o 0 -v 1"),
              "vmnic4 does not support EEPROM access (driver usbnet)");
    AddFault("HostCtl::Network::Pnic::SetEepromValue", "vmnic0", "write protected");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic0 -m 1212436036 -o 0 -v 1"), "write protected");
}

TEST_F(NicDiagTest, EepromChangeFromAFile) {
    const std::string image = File("image.bin", std::string("\x01\x02\x03\x04\xff", 5));
    EXPECT_EQ(Json("network nic eeprom change -n vmnic2 -m 1212436038 -f " + image), true);
    EXPECT_EQ(Json("network nic eeprom dump -n vmnic2 -l 8")[0]["Value"], "01 02 03 04 ff 06 f0 84 ");
    // Exactly the EEPROM's size is fine; one byte more is not.
    EXPECT_EQ(Json("network nic eeprom change -n vmnic2 -m 1212436038 -f " +
                   File("full.bin", std::string(64, 'A'))),
              true);
    std::string filled;
    for (int i = 0; i < 64; ++i)
        filled += "41";
    EXPECT_EQ(Nic("vmnic2")["eeprom"]["data"], filled);
    const std::string large = File("large.bin", std::string(65, 'B'));
    EXPECT_EQ(Error("network nic eeprom change -n vmnic2 -m 1212436038 -f " + large),
              "EEPROM file " + large + " (65 bytes) is larger than the EEPROM of vmnic2 (64 bytes)");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic2 -m 1 -f " + image),
              "Wrong magic key 1 for the EEPROM of vmnic2 (64 bytes)");

    const std::string link = dir_ + "/link.bin";
    ASSERT_EQ(symlink(image.c_str(), link.c_str()), 0);
    EXPECT_EQ(Error("network nic eeprom change -n vmnic2 -m 1212436038 -f " + link),
              "Cannot use EEPROM file " + link + ": it is a symbolic link");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic2 -m 1212436038 -f " + dir_),
              "Cannot use EEPROM file " + dir_ + ": not a regular file");
    const std::string fifo = dir_ + "/fifo";
    ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
    EXPECT_EQ(Error("network nic eeprom change -n vmnic2 -m 1212436038 -f " + fifo),
              "Cannot use EEPROM file " + fifo + ": not a regular file");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic2 -m 1212436038 -f /dev/zero"),
              "Cannot use EEPROM file /dev/zero: not a regular file");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic2 -m 1212436038 -f " + dir_ + "/missing"),
              "Cannot open EEPROM file " + dir_ + "/missing: No such file or directory");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic2 -m 1212436038 -f " + File("empty.bin", "")),
              "EEPROM file " + dir_ + "/empty.bin is empty");
    EXPECT_EQ(Error("network nic eeprom change -n vmnic2 -m 1212436038 -f ''"), "No EEPROM file given");
}

// ---------------------------------------------------------------- self test and negotiation

TEST_F(NicDiagTest, SelfTest) {
    EXPECT_EQ(Json("network nic selftest run -n vmnic0"), json::parse(R"([
        {"Item":"Result","Value":"Passed"},
        {"Item":"Info","Value":"Register test (offline): passed"},
        {"Item":"Info","Value":"EEPROM test (offline): passed"},
        {"Item":"Info","Value":"Interrupt test (offline): passed"},
        {"Item":"Info","Value":"Loopback test (offline): passed"}])"));
    EXPECT_EQ(Json("network nic selftest run -n vmnic0 -o 1"), json::parse(R"([
        {"Item":"Result","Value":"Passed"},
        {"Item":"Info","Value":"Register test (online): passed"},
        {"Item":"Info","Value":"Link test (online): passed"}])"));
    EXPECT_EQ(Json("network nic selftest run -n vmnic0 --online 0").size(), 5u);
    // Without a link, the link test fails.
    EXPECT_EQ(Json("network nic selftest run -n vmnic2 -o 1"), json::parse(R"([
        {"Item":"Result","Value":"Failed"},
        {"Item":"Info","Value":"Register test (online): passed"},
        {"Item":"Info","Value":"Link test (online): failed"}])"));
    EXPECT_EQ(Run("network nic selftest run -n vmnic0 -o 1").out,
              "Item    Value\n------  ------------------------------\nResult  Passed\n"
              "Info    Register test (online): passed\nInfo    Link test (online): passed\n");

    EXPECT_EQ(Error("network nic selftest run -n vmnic9"), "Pnic with name vmnic9 not found");
    EXPECT_EQ(Error("network nic selftest run -n vmnic4"),
              "vmnic4 does not support self tests (driver usbnet)");
    AddFault("HostCtl::Network::Pnic::RunSelfTest", "vmnic0", "test aborted");
    EXPECT_EQ(Error("network nic selftest run -n vmnic0"), "test aborted");
}

TEST_F(NicDiagTest, NegotiationRestart) {
    StartJournal();
    EXPECT_EQ(Json("network nic negotiate restart -n vmnic3"), true);
    EXPECT_EQ(Journal("HostCtl::Network::Pnic::RestartNegotiation"),
              std::vector<std::string>{"HostCtl::Network::Pnic::RestartNegotiation vmnic3"});
    EXPECT_EQ(Json("network nic set -n vmnic3 -S 100 -D full"), true);
    EXPECT_EQ(Error("network nic negotiate restart -n vmnic3"),
              "Auto-negotiation is off on vmnic3: there is no negotiation to restart (a speed and duplex are "
              "forced)");
    EXPECT_EQ(Json("network nic set -n vmnic3 --auto"), true);
    EXPECT_EQ(Json("network nic down -n vmnic3"), true);
    EXPECT_EQ(Error("network nic negotiate restart -n vmnic3"),
              "vmnic3 is down: bring it up to negotiate its link");
    EXPECT_EQ(Error("network nic negotiate restart -n vmnic9"), "Pnic with name vmnic9 not found");
    AddFault("HostCtl::Network::Pnic::RestartNegotiation", "vmnic0", "PHY not responding");
    EXPECT_EQ(Error("network nic negotiate restart -n vmnic0"), "PHY not responding");
}

}  // namespace

// "network nic" coalescing, offloads, pause, rings and software simulation on fixture hosts.
#include <nlohmann/json.hpp>

#include "harness.h"

namespace {

using nlohmann::json;

class NicTunablesTest : public Hadro::Test::CommandTest {
protected:
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
    static json Entry(const json& list, const std::string& name) {
        for (const auto& entry : list)
            if (entry["NIC"] == name) return entry;
        return json();
    }
};

// ---------------------------------------------------------------- coalescing

TEST_F(NicTunablesTest, CoalesceGetListsEveryAdapterWithNAForTheUnsupported) {
    auto list = Json("network nic coalesce get");
    ASSERT_EQ(list.size(), 7u);
    EXPECT_EQ(list[0], json::parse(R"({"NIC":"vmnic0","RX microseconds":"50","RX maximum frames":"16",
        "TX microseconds":"50","TX Maximum frames":"32","Adaptive RX":"On","Adaptive TX":"Off",
        "Sample interval seconds":"3"})"));
    EXPECT_EQ(list[4], json::parse(R"({"NIC":"vmnic4","RX microseconds":"N/A","RX maximum frames":"N/A",
        "TX microseconds":"N/A","TX Maximum frames":"N/A","Adaptive RX":"N/A","Adaptive TX":"N/A",
        "Sample interval seconds":"N/A"})"));
    EXPECT_EQ(Json("network nic coalesce get -n vmnic2").size(), 1u);
    // One named adapter whose read fails is still listed with N/A.
    EXPECT_EQ(Json("network nic coalesce get -n vmnic4")[0]["Adaptive RX"], "N/A");
    EXPECT_EQ(Error("network nic coalesce get -n vmnic9"), "Pnic with name vmnic9 not found");
}

TEST_F(NicTunablesTest, CoalesceSetIsAReadModifyWrite) {
    EditNic("vmnic0", [](json& nic) { nic["coalesce"]["rxUsecsIrq"] = 7; });
    StartJournal();
    EXPECT_EQ(Json("network nic coalesce set -n vmnic0"), true);
    EXPECT_EQ(Journal("HostCtl::Network::Pnic::SetCoalesceParams").size(), 1u);
    EXPECT_EQ(Json("network nic coalesce set -n vmnic0 -r 100 -R 0 -t 75 -T 64 -a false -A true -i 10"),
              true);
    auto c = Nic("vmnic0")["coalesce"];
    EXPECT_EQ(c["rxUsecs"], 100);
    EXPECT_EQ(c["rxMaxFrames"], 0);
    EXPECT_EQ(c["txUsecs"], 75);
    EXPECT_EQ(c["txMaxFrames"], 64);
    EXPECT_EQ(c["adaptiveRx"], false);
    EXPECT_EQ(c["adaptiveTx"], true);
    EXPECT_EQ(c["sampleInterval"], 10);
    EXPECT_EQ(c["rxUsecsLow"], 25);  // untouched fields are kept
    EXPECT_EQ(c["rxUsecsIrq"], 7);   // and so are the driver's further fields
}

TEST_F(NicTunablesTest, CoalesceSetRefusals) {
    EXPECT_EQ(Error("network nic coalesce set -n vmnic9 -r 1"), "Pnic with name vmnic9 not found");
    EXPECT_EQ(Error("network nic coalesce set -n vmnic4 -r 1"),
              "vmnic4 does not support interrupt coalescing (driver usbnet)");
    EXPECT_EQ(Error("network nic coalesce set -n vmnic0 -r -1"),
              "Invalid value -1 for --rx-usecs: expected a number from 0 to 4294967295.");
    EXPECT_EQ(Error("network nic coalesce set -n vmnic0 -T 4294967296"),
              "Invalid value 4294967296 for --tx-max-frames: expected a number from 0 to 4294967295.");
    EXPECT_EQ(Error("network nic coalesce set -n vmnic2 -a true"),
              "Adaptive coalescing needs a sample interval of 1 to 3600 seconds");
    EXPECT_EQ(Run("network nic coalesce set -n vmnic0 -i 0").status, 2);
    EXPECT_EQ(Nic("vmnic0")["coalesce"]["rxUsecs"], 50);
}

TEST_F(NicTunablesTest, CoalesceLowAndHighRates) {
    EXPECT_EQ(Json("network nic coalesce low get -n vmnic0"),
              json::parse(R"({"NIC":"vmnic0","Packet rate":10000,"RX delay time":25,"RX delay packets":4,
                  "TX delay time":25,"TX delay packets":8})"));
    EXPECT_EQ(Json("network nic coalesce high get -n vmnic0"),
              json::parse(R"({"NIC":"vmnic0","Packet rate":150000,"RX delay time":150,"RX delay packets":32,
                  "TX delay time":150,"TX delay packets":64})"));
    auto simple = Run("network nic coalesce low get -n vmnic5");
    EXPECT_EQ(simple.out,
              "NIC: vmnic5\nPacket rate: 10000 pps\nRX delay time: 4 microsecond\nRX delay packets: 32\n"
              "TX delay time: 8 microsecond\nTX delay packets: 64\n");

    EXPECT_EQ(Json("network nic coalesce low set -n vmnic0 -p 5000 -r 10 -R 2 -t 11 -T 3"), true);
    EXPECT_EQ(Json("network nic coalesce high set -n vmnic0 -p 200000 -r 300 -R 64 -t 301 -T 128"), true);
    auto c = Nic("vmnic0")["coalesce"];
    EXPECT_EQ(c["lowPacketRate"], 5000);
    EXPECT_EQ(c["rxUsecsLow"], 10);
    EXPECT_EQ(c["rxMaxFramesLow"], 2);
    EXPECT_EQ(c["txUsecsLow"], 11);
    EXPECT_EQ(c["txMaxFramesLow"], 3);
    EXPECT_EQ(c["highPacketRate"], 200000);
    EXPECT_EQ(c["rxUsecsHigh"], 300);
    EXPECT_EQ(c["txMaxFramesHigh"], 128);
    EXPECT_EQ(c["rxUsecs"], 50);

    EXPECT_EQ(Error("network nic coalesce low set -n vmnic0 -p 300000"),
              "The low packet rate (300000 pps) must be below the high packet rate (200000 pps)");
    EXPECT_EQ(Error("network nic coalesce high get -n vmnic9"), "Pnic with name vmnic9 not found");
    EXPECT_EQ(Error("network nic coalesce low get -n vmnic4"),
              "vmnic4 does not support interrupt coalescing (driver usbnet)");
}

// ---------------------------------------------------------------- offloads

TEST_F(NicTunablesTest, OffloadListings) {
    EXPECT_EQ(Entry(Json("network nic cso get"), "vmnic4"),
              json::parse(R"({"NIC":"vmnic4","RX Checksum Offload":"on","TX Checksum Offload":"on"})"));
    EXPECT_EQ(Entry(Json("network nic tso get"), "vmnic2"), json::parse(R"({"NIC":"vmnic2","Value":"off"})"));
    EXPECT_EQ(Entry(Json("network nic sg get"), "vmnic4"), json::parse(R"({"NIC":"vmnic4","Value":"off"})"));
    // A failing read shows N/A for that adapter only.
    AddFault("HostCtl::Network::Pnic::GetOffloadSettings", "vmnic1", "offloads unavailable");
    auto cso = Json("network nic cso get");
    EXPECT_EQ(cso.size(), 7u);
    EXPECT_EQ(Entry(cso, "vmnic1"),
              json::parse(R"({"NIC":"vmnic1","RX Checksum Offload":"N/A","TX Checksum Offload":"N/A"})"));
    EXPECT_EQ(Entry(cso, "vmnic0")["RX Checksum Offload"], "on");
    EXPECT_EQ(Json("network nic tso get -n vmnic1")[0]["Value"], "N/A");
    EXPECT_EQ(Json("network nic sg get -n vmnic1")[0]["Value"], "N/A");
    for (const char* command : {"cso", "tso", "sg"})
        EXPECT_EQ(Error(std::string("network nic ") + command + " get -n vmnic9"),
                  "Pnic with name vmnic9 not found");
}

TEST_F(NicTunablesTest, OffloadSetsChangeOnlyTheirSwitches) {
    StartJournal();
    EXPECT_EQ(Json("network nic cso set -n vmnic0 -e 0"), true);
    EXPECT_EQ(Json("network nic tso set -n vmnic2 --enable 1"), true);
    EXPECT_EQ(Json("network nic sg set -n vmnic4 -e 1"), true);
    auto sets = Journal("HostCtl::Network::Pnic::SetOffloadSettings");
    ASSERT_EQ(sets.size(), 3u);
    EXPECT_EQ(sets[0],
              "HostCtl::Network::Pnic::SetOffloadSettings vmnic0 mask=0x3 rxcsum=false txcsum=false sg=true "
              "tso=true");
    EXPECT_EQ(sets[1].substr(0, 60), "HostCtl::Network::Pnic::SetOffloadSettings vmnic2 mask=0x8 r");
    EXPECT_EQ(sets[2].substr(0, 60), "HostCtl::Network::Pnic::SetOffloadSettings vmnic4 mask=0x4 r");
    EXPECT_EQ(Nic("vmnic0")["offload"], json::parse(R"({"rxChecksum":false,"txChecksum":false,
        "scatterGather":true,"tso":true,"gso":true,"gro":true,"lro":false})"));
    EXPECT_EQ(Nic("vmnic2")["offload"]["tso"], true);
    EXPECT_EQ(Nic("vmnic4")["offload"]["scatterGather"], true);
    EXPECT_EQ(Nic("vmnic4")["offload"]["tso"], false);
    EXPECT_EQ(Json("network nic cso set -n vmnic0 -e 1"), true);
    EXPECT_EQ(Nic("vmnic0")["offload"]["txChecksum"], true);
    EXPECT_EQ(Run("network nic cso set -n vmnic0 -e 2").status, 2);
    for (const char* command : {"cso", "tso", "sg"})
        EXPECT_EQ(Error(std::string("network nic ") + command + " set -n vmnic9 -e 1"),
                  "Pnic with name vmnic9 not found");
}

// ---------------------------------------------------------------- pause

TEST_F(NicTunablesTest, PauseParamsListResolution) {
    auto list = Json("network nic pauseParams list");
    ASSERT_EQ(list.size(), 7u);
    // Both resolution codes set: RX 2 (off), TX 1 (on).
    EXPECT_EQ(Entry(list, "vmnic3"), json::parse(R"({"NIC":"vmnic3","Pause Params Supported":true,
        "Auto Negotiation":true,"Pause RX":true,"Pause TX":true,"Auto Negotiation Resolution Avail":true,
        "RX Auto Negotiation Resolution":false,"TX Auto Negotiation Resolution":true})"));
    // No link: nothing resolved.
    EXPECT_EQ(Entry(list, "vmnic2")["Auto Negotiation Resolution Avail"], false);
    EXPECT_EQ(Entry(list, "vmnic4"), json::parse(R"({"NIC":"vmnic4","Pause Params Supported":false,
        "Auto Negotiation":false,"Pause RX":false,"Pause TX":false,"Auto Negotiation Resolution Avail":false,
        "RX Auto Negotiation Resolution":false,"TX Auto Negotiation Resolution":false})"));

    EditNic("vmnic3", [](json& nic) { nic["pause"]["rxResolution"] = 0; });
    auto one = Json("network nic pauseParams list -n vmnic3");
    ASSERT_EQ(one.size(), 1u);
    EXPECT_EQ(one[0]["Auto Negotiation Resolution Avail"], false);
    EXPECT_EQ(one[0]["TX Auto Negotiation Resolution"], false);
    // A failing read shows the adapter as not supporting pause.
    AddFault("HostCtl::Network::Pnic::GetPauseParams", "vmnic0", "no pause");
    EXPECT_EQ(Json("network nic pauseParams list -n vmnic0")[0]["Pause Params Supported"], false);
    EXPECT_EQ(Error("network nic pauseParams list -n vmnic9"), "NIC with name vmnic9 not found");
}

TEST_F(NicTunablesTest, PauseParamsSet) {
    StartJournal();
    EXPECT_EQ(Json("network nic pauseParams set -n vmnic0"), true);
    EXPECT_EQ(Journal("HostCtl::Network::Pnic::SetPauseParams"),
              std::vector<std::string>{
                  "HostCtl::Network::Pnic::SetPauseParams vmnic0 autoneg=true rx=true tx=true"});
    EXPECT_EQ(Json("network nic pauseParams set -n vmnic0 --rx false"), true);
    EXPECT_EQ(Nic("vmnic0")["pause"],
              json::parse(R"({"supported":true,"autoNegotiate":true,"rx":false,"tx":true,
        "rxResolution":2,"txResolution":1})"));
    EXPECT_EQ(Json("network nic pauseParams set -n vmnic0 -a false -r true -t false"), true);
    EXPECT_EQ(Nic("vmnic0")["pause"],
              json::parse(R"({"supported":true,"autoNegotiate":false,"rx":true,"tx":false,
        "rxResolution":0,"txResolution":0})"));

    EXPECT_EQ(Error("network nic pauseParams set -n vmnic9 -r true"), "NIC with name vmnic9 not found");
    EXPECT_EQ(Error("network nic pauseParams set -n vmnic4 -r true"),
              "vmnic4 does not support pause parameters");
    // Pause negotiation rides on link negotiation.
    EXPECT_EQ(Json("network nic set -n vmnic1 -S 1000 -D full"), true);
    EXPECT_EQ(
        Error("network nic pauseParams set -n vmnic1 -a true"),
        "Pause auto-negotiation needs link auto-negotiation, which is off on vmnic1 (a speed and duplex are "
        "forced)");
}

// ---------------------------------------------------------------- rings

TEST_F(NicTunablesTest, Rings) {
    EXPECT_EQ(Json("network nic ring preset get -n vmnic2"),
              json::parse(R"({"RX":2047,"RX Mini":0,"RX Jumbo":255,"TX":511})"));
    EXPECT_EQ(Json("network nic ring current get -n vmnic2"),
              json::parse(R"({"RX":512,"RX Mini":0,"RX Jumbo":0,"TX":511})"));
    EXPECT_EQ(Run("network nic ring current get -n vmnic2").out,
              "RX: 512\nRX Mini: 0\nRX Jumbo: 0\nTX: 511\n");

    StartJournal();
    EXPECT_EQ(Json("network nic ring current set -n vmnic2"), true);
    EXPECT_TRUE(Journal("HostCtl::Network::Pnic::SetRingParams").empty());
    EXPECT_EQ(Json("network nic ring current set -n vmnic2 -r 2047 -j 128"), true);
    EXPECT_EQ(Journal("HostCtl::Network::Pnic::SetRingParams"),
              std::vector<std::string>{
                  "HostCtl::Network::Pnic::SetRingParams vmnic2 mask=0x5 rx=2047 rxJumbo=128"});
    EXPECT_EQ(Json("network nic ring current get -n vmnic2"),
              json::parse(R"({"RX":2047,"RX Mini":0,"RX Jumbo":128,"TX":511})"));

    EXPECT_EQ(Error("network nic ring current set -n vmnic2 -t 512"),
              "TX ring size 512 exceeds the maximum of 511 on vmnic2");
    EXPECT_EQ(Error("network nic ring current set -n vmnic2 -m 1"), "vmnic2 has no RX mini ring");
    EXPECT_EQ(Error("network nic ring current set -n vmnic2 -r 0"), "RX ring size must be at least 1");
    EXPECT_EQ(Error("network nic ring current set -n vmnic2 -r 100 -t -5"),
              "Invalid value -5 for --tx: expected a number from 0 to 4294967295.");
    EXPECT_EQ(Nic("vmnic2")["ring"]["current"]["rx"], 2047);
    for (const char* command : {"ring preset get", "ring current get", "ring current set"})
        EXPECT_EQ(Error(std::string("network nic ") + command + " -n vmnic9"),
                  "NIC with name vmnic9 not found");
}

// ---------------------------------------------------------------- software simulation

TEST_F(NicTunablesTest, SoftwareList) {
    EditNic("vmnic1", [](json& nic) {
        nic["software"]["geneveOffload"] = true;
        nic["software"]["ipv4Cso"] = true;
    });
    auto list = Json("network nic software list");
    ASSERT_EQ(list.size(), 7u);
    EXPECT_EQ(list[1], json::parse(R"({"NIC":"vmnic1","IPv4 CSO":"on","IPv4 TSO":"off","Scatter Gather":"off",
        "Offset Based Offload":"off","VXLAN Encap":"off","Geneve Offload":"on","IPv6 TSO":"off",
        "IPv6 TSO Ext":"off","IPv6 CSO":"off","IPv6 CSO Ext":"off","High DMA":"off","Scatter Gather MP":"off",
        "VLAN Tagging":"off","VLAN Untagging":"off"})"));
    EXPECT_EQ(list[4]["Geneve Offload"], "N/A");
    EXPECT_EQ(list[4]["VLAN Untagging"], "N/A");

    auto some = Json("network nic software list -n vmnic5 -n vmnic1");
    ASSERT_EQ(some.size(), 2u);
    EXPECT_EQ(some[0]["NIC"], "vmnic5");
    EXPECT_EQ(some[1]["NIC"], "vmnic1");
    EXPECT_EQ(Error("network nic software list -n vmnic0 -n vmnic9 -n vmnic8"),
              "Can't find PNIC with name vmnic9");
}

TEST_F(NicTunablesTest, SoftwareSetSendsOnlyTheGivenSwitches) {
    EditNic("vmnic0", [](json& nic) { nic["software"]["tagging"] = true; });
    StartJournal();
    EXPECT_EQ(Json("network nic software set -n vmnic0"), true);
    EXPECT_TRUE(Journal("HostCtl::Network::Pnic::SetSoftwareSettings").empty());
    EXPECT_EQ(Json("network nic software set -n vmnic0 --sg false"), true);
    EXPECT_EQ(Json("network nic software set -n vmnic0 --ipv4cso true --geneveoffload true --untagging yes"),
              true);
    EXPECT_EQ(
        Journal("HostCtl::Network::Pnic::SetSoftwareSettings"),
        (std::vector<std::string>{
            "HostCtl::Network::Pnic::SetSoftwareSettings vmnic0 mask=0x4 sg=false",
            "HostCtl::Network::Pnic::SetSoftwareSettings vmnic0 mask=0x3001 ipv4Cso=true untagging=true "
            "geneveOffload=true"}));
    auto software = Nic("vmnic0")["software"];
    EXPECT_EQ(software["ipv4Cso"], true);
    EXPECT_EQ(software["geneveOffload"], true);
    EXPECT_EQ(software["untagging"], true);
    EXPECT_EQ(software["tagging"], true);  // not selected: kept
    EXPECT_EQ(software["sg"], false);

    EXPECT_EQ(Error("network nic software set -n vmnic9 --sg true"), "Pnic with name vmnic9 not found");
    EXPECT_EQ(Error("network nic software set -n vmnic4 --sg true"),
              "vmnic4 does not support software simulation of offloads (driver usbnet)");
}

// ---------------------------------------------------------------- host failures

// Every command reports a failing host-control call with the call's own message.
TEST_F(NicTunablesTest, HostFailuresAreReported) {
    const std::pair<const char*, const char*> cases[] = {
        {"network nic coalesce set -n vmnic0 -r 5", "SetCoalesceParams"},
        {"network nic coalesce low get -n vmnic0", "GetCoalesceParams"},
        {"network nic coalesce low set -n vmnic0 -r 5", "SetCoalesceParams"},
        {"network nic coalesce high get -n vmnic0", "GetCoalesceParams"},
        {"network nic coalesce high set -n vmnic0 -r 5", "SetCoalesceParams"},
        {"network nic cso set -n vmnic0 -e 1", "GetOffloadSettings"},
        {"network nic tso set -n vmnic0 -e 1", "SetOffloadSettings"},
        {"network nic sg set -n vmnic0 -e 1", "SetOffloadSettings"},
        {"network nic pauseParams set -n vmnic0 -r true", "SetPauseParams"},
        {"network nic ring preset get -n vmnic0", "GetRingParams"},
        {"network nic ring current get -n vmnic0", "GetRingParams"},
        {"network nic ring current set -n vmnic0 -r 5", "SetRingParams"},
        {"network nic software set -n vmnic0 --sg true", "SetSoftwareSettings"},
    };
    for (const auto& [command, operation] : cases) {
        TearDown();
        SetUp();
        AddFault(std::string("HostCtl::Network::Pnic::") + operation, "vmnic0",
                 "injected " + std::string(operation));
        EXPECT_EQ(Error(command), "injected " + std::string(operation)) << command;
    }
    // Listings fail as a whole only when the adapters cannot be listed.
    const char* listings[] = {"coalesce get", "cso get",          "tso get",
                              "sg get",       "pauseParams list", "software list"};
    for (const char* listing : listings) {
        TearDown();
        SetUp();
        AddFault("TknCtl::Network::NetworkInfoImpl::GetPnics", "", "no adapters");
        EXPECT_EQ(Error(std::string("network nic ") + listing), "no adapters") << listing;
    }
}

}  // namespace

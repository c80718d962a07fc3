// "network port stats get" and "network port filter stats get" on fixture hosts.
#include "dvs_test.h"

namespace Hadro::Test {
namespace {

using Strings = std::vector<std::string>;

class PortStatsTest : public DvsTest {
protected:
    static nlohmann::json Filter(const char* name, bool direction, bool valid = true, bool extended = true) {
        return {{"name", name},           {"valid", valid},
                {"direction", direction}, {"extendedValid", extended},
                {"packetsIn", 10},        {"packetsOut", 9},
                {"packetsDropped", 1},    {"packetsFiltered", 2},
                {"packetsFaulted", 3},    {"packetsQueued", 4},
                {"packetsInjected", 5},   {"packetErrors", 6}};
    }
    static Strings Names(const nlohmann::json& filters) {
        Strings names;
        for (const auto& f : filters)
            names.push_back(f["Filter name"].get<std::string>() + "/" +
                            f["Filter direction"].get<std::string>());
        return names;
    }
};

TEST_F(PortStatsTest, PacketStatisticsOfAPort) {
    auto r = Run("network port stats get -p 33554437");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out,
              "Packet statistics for port 33554437\n"
              "   Packets received: 10803879\n"
              "   Packets sent: 8911899\n"
              "   Bytes received: 7562715300\n"
              "   Bytes sent: 5792734350\n"
              "   Broadcast packets received: 19899\n"
              "   Broadcast packets sent: 369\n"
              "   Multicast packets received: 73080\n"
              "   Multicast packets sent: 108\n"
              "   Unicast packets received: 10710900\n"
              "   Unicast packets sent: 8911422\n"
              "   Receive packets dropped: 27\n"
              "   Transmit packets dropped: 0\n");
    // Ports of distributed switches too; the ID is in the record.
    auto list = Json("network port stats get --portid 67108869");
    ASSERT_EQ(list.size(), 1u);
    EXPECT_EQ(list[0]["Port ID"], 67108869);
}

TEST_F(PortStatsTest, UnicastCountersStopAtZero) {
    EditHost([](nlohmann::json& doc) {
        auto& stats = PortById(doc, 33554437)["stats"];
        stats["rxPackets"] = 100;
        stats["rxBroadcast"] = 60;
        stats["rxMulticast"] = 40;  // exactly the total
        stats["txPackets"] = 100;
        stats["txBroadcast"] = 70;
        stats["txMulticast"] = 31;  // read mid-update: more than the total
    });
    auto port = Json("network port stats get -p 33554437")[0];
    EXPECT_EQ(port["Unicast packets received"], 0);
    EXPECT_EQ(port["Unicast packets sent"], 0);

    // Parts whose sum does not fit in 64 bits.
    EditHost([](nlohmann::json& doc) {
        auto& stats = PortById(doc, 33554437)["stats"];
        stats["rxBroadcast"] = 18446744073709551615ull;
        stats["rxMulticast"] = 2;
    });
    EXPECT_EQ(Json("network port stats get -p 33554437")[0]["Unicast packets received"], 0);
}

TEST_F(PortStatsTest, UnknownPort) {
    // No such port, a negative number, and a port's ID plus 2^32 (never wrapped onto it).
    for (const char* id : {"5", "-1", "4328521733"}) {
        for (const char* command : {"network port stats get -p ", "network port filter stats get -p "}) {
            auto r = Run(std::string(command) + id);
            EXPECT_EQ(r.status, 1) << command << id;
            EXPECT_EQ(r.out, "") << command << id;
            EXPECT_EQ(r.Errors(), Strings{"Couldn't find requested port"}) << command << id;
        }
    }
}

TEST_F(PortStatsTest, FilterOrderDirectionAndValidity) {
    EditHost([](nlohmann::json& doc) {
        PortById(doc, 33554437)["filters"] = {
            Filter("b", false),        Filter("y", true),   Filter("a", false, true, false),
            Filter("z", true),         Filter("ab", false), Filter("c", false, false),
            Filter("\xc3\xa9", false), Filter("za", true)};
        PortById(doc, 67108866)["filters"] = {Filter("in", false), Filter("out", true)};
    });
    // Receive-side names ascending (a prefix first, bytes unsigned), then send-side descending;
    // the invalid filter "c" is left out.
    auto filters = Json("network port filter stats get -p 33554437");
    EXPECT_EQ(Names(filters), (Strings{"a/Receive", "ab/Receive", "b/Receive", "\xc3\xa9/Receive",
                                       "za/Transmit", "z/Transmit", "y/Transmit"}));
    // Without extended counters only the first three are shown.
    EXPECT_EQ(filters[0],
              nlohmann::json::parse(R"({"Filter name":"a","Filter direction":"Receive","Packets in":10,
        "Packets out":9,"Packets dropped":1,"Packets filtered":0,"Packets faulted":0,"Packets queued":0,
        "Packets injected":0,"Packet errors":0})"));
    EXPECT_EQ(filters[1]["Packet errors"], 6);

    // On an uplink port (type 4) the directions swap.
    EXPECT_EQ(Names(Json("network port filter stats get -p 67108866")),
              (Strings{"in/Transmit", "out/Receive"}));

    auto r = Run("network port filter stats get -p 33554438");
    EXPECT_EQ(r.out,
              "Filter statistics for hadro-fw\n"
              "   Filter direction: Receive\n"
              "   Packets in: 176042\n"
              "   Packets out: 175980\n"
              "   Packets dropped: 62\n"
              "   Packets filtered: 58\n"
              "   Packets faulted: 0\n"
              "   Packets queued: 4\n"
              "   Packets injected: 0\n"
              "   Packet errors: 0\n");

    // A port without filters gives an empty list.
    r = Run("--formatter=json network port filter stats get -p 33554434");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, "[]\n");
}

TEST_F(PortStatsTest, HostFailures) {
    AddFault("HostCtl::Network::Port::GetTrafficStats", "33554437", "counters are being reset");
    auto r = Run("network port stats get -p 33554437");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"Unable to get stats for port: counters are being reset"});

    // The list is already the result when the filters cannot be read.
    AddFault("HostCtl::Network::Port::GetFilterStats", "33554437", "filter module not loaded");
    r = Run("--formatter=json network port filter stats get -p 33554437");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "[]\n");
    EXPECT_EQ(r.Errors(), Strings{"Unable to get filter stats for port: filter module not loaded"});

    // The lookup itself.
    AddFault("TknCtl::Network::VirtualSwitchInfoImpl::GetAllSwitches", "", "switch table unavailable");
    EXPECT_EQ(Run("network port stats get -p 33554437").Errors(),
              Strings{"Unable to get stats for port: switch table unavailable"});
}

}  // namespace
}  // namespace Hadro::Test

// "network port stats get" and "network port filter stats get" on fixture hosts.
#include "dvs_test.h"

namespace Hadro::Test {
namespace {

using Strings = std::vector<std::string>;

class PortStatsTest : public DvsTest {
protected:
    static nlohmann::json Filter(const char* name, bool direction, bool valid = true, bool extended = true) {
        return {{"name", name},    {"valid", valid},   {"direction", direction}, {"extendedValid", extended},
                {"packetsIn", 10}, {"packetErrors", 6}};
    }
    // "name/direction" of each listed filter.
    Strings Filters(const std::string& portId) {
        Strings names;
        for (const auto& f : Json("network port filter stats get -p " + portId))
            names.push_back(f["Filter name"].get<std::string>() + "/" +
                            f["Filter direction"].get<std::string>());
        return names;
    }
};

TEST_F(PortStatsTest, PacketStatisticsAndUnicastThatNeverWraps) {
    auto r = Run("network port stats get -p 33554437");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out.rfind("Packet statistics for port 33554437\n   Packets received: 10803879\n", 0), 0u)
        << r.out;
    EXPECT_NE(r.out.find("   Unicast packets received: 10710900\n   Unicast packets sent: 8911422\n"),
              std::string::npos);

    // Broadcast and multicast exactly the total, more than it (read mid-update), beyond 64 bits.
    EditHost([](nlohmann::json& doc) {
        auto& stats = PortById(doc, 67108869)["stats"];
        stats.update({{"rxPackets", 100}, {"rxBroadcast", 60}, {"rxMulticast", 40}});
        stats.update({{"txPackets", 100}, {"txBroadcast", 70}, {"txMulticast", 31}});
        PortById(doc, 67108870)["stats"].update(
            {{"rxBroadcast", 18446744073709551615ull}, {"rxMulticast", 2}});
    });
    auto port = Json("network port stats get --portid 67108869")[0];
    EXPECT_EQ(port["Port ID"], 67108869);
    EXPECT_EQ(port["Unicast packets received"], 0);
    EXPECT_EQ(port["Unicast packets sent"], 0);
    auto wide = Json("network port stats get -p 67108870")[0];
    EXPECT_EQ(wide["Unicast packets received"], 0);
    EXPECT_EQ(wide["Broadcast packets received"], 18446744073709551615ull);
}

TEST_F(PortStatsTest, UnknownPort) {
    // No such port, a negative number, a port's ID plus 2^32 (never wrapped onto it).
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
    // Receive side ascending (a prefix first, bytes unsigned), then send side descending; the
    // invalid "c" is left out.
    EXPECT_EQ(Filters("33554437"), (Strings{"a/Receive", "ab/Receive", "b/Receive", "\xc3\xa9/Receive",
                                            "za/Transmit", "z/Transmit", "y/Transmit"}));
    // Without extended counters the last five stay 0.
    auto filters = Json("network port filter stats get -p 33554437");
    EXPECT_EQ(filters[0]["Packets in"], 10);
    EXPECT_EQ(filters[0]["Packet errors"], 0);
    EXPECT_EQ(filters[1]["Packet errors"], 6);
    // On an uplink port (type 4) the directions swap.
    EXPECT_EQ(Filters("67108866"), (Strings{"in/Transmit", "out/Receive"}));

    auto r = Run("network port filter stats get -p 33554438");
    EXPECT_EQ(r.out.rfind(
                  "Filter statistics for hadro-fw\n   Filter direction: Receive\n   Packets in: 176042\n", 0),
              0u)
        << r.out;
    EXPECT_EQ(Filters("33554434"), Strings{});
}

TEST_F(PortStatsTest, HostFailures) {
    AddFault("HostCtl::Network::Port::GetTrafficStats", "33554437", "counters are being reset");
    auto r = Run("network port stats get -p 33554437");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"Unable to get stats for port: counters are being reset"});

    // The empty list is already the result when the filters cannot be read.
    AddFault("HostCtl::Network::Port::GetFilterStats", "33554437", "filter module not loaded");
    r = Run("--formatter=json network port filter stats get -p 33554437");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "[]\n");
    EXPECT_EQ(r.Errors(), Strings{"Unable to get filter stats for port: filter module not loaded"});
}

}  // namespace
}  // namespace Hadro::Test

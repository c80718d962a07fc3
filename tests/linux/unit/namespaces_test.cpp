// Netstacks of the Linux host without a kernel: what the host's document keeps of netstacks,
// and how congestion-control algorithms are named and refused.
#include <gtest/gtest.h>

#include <stdexcept>

#include <nlohmann/json.hpp>

#include "network/netstack.h"

namespace {

using namespace TknCtl::Linux;
using nlohmann::json;

TEST(NetstackRecords, ReadAndWrittenBack) {
    auto records = ParseNetstackRecords(json::parse(R"({
        "glidex": {"name": "Glidex stack"},
        "backup": {"disabled": true, "maxConnections": 3000, "congestionControl": "cubic", "ipv6Enabled": false}
    })"));
    ASSERT_EQ(records.size(), 2u);
    EXPECT_EQ(records["glidex"].name, "Glidex stack");
    EXPECT_FALSE(records["glidex"].disabled);
    EXPECT_EQ(records["backup"], (NetstackRecord{"", true, 3000, "cubic", false}));
    EXPECT_EQ(ParseNetstackRecords(NetstackRecordsJson(records)), records);
    EXPECT_TRUE(ParseNetstackRecords(json()).empty());
    // A netstack whose namespace holds everything leaves nothing in the document.
    records["plain"] = NetstackRecord{};
    EXPECT_FALSE(NetstackRecordsJson(records).contains("plain"));
}

TEST(NetstackRecords, DamagedMembersAreRefusedSayingWhy) {
    const std::pair<const char*, const char*> damaged[] = {
        {R"([1])", "not an object"},
        {R"({"a": 1})", "'a': not an object"},
        {R"({"../etc": {}})", "'../etc': no name a namespace can have"},
        {R"({"a": {"name": 7}})", "'a': member 'name' is unknown or of the wrong type"},
        {R"({"a": {"colour": "red"}})", "'a': member 'colour' is unknown"},
        {R"({"a": {"disabled": true, "maxConnections": 4294967296, "congestionControl": "x", "ipv6Enabled": true}})",
         "member 'maxConnections'"},
        {R"({"a": {"disabled": true, "maxConnections": 5}})",
         "'a': a disabled netstack needs maxConnections, congestionControl and ipv6Enabled"},
    };
    for (const auto& [text, why] : damaged) {
        try {
            ParseNetstackRecords(json::parse(text));
            ADD_FAILURE() << text << " was taken";
        } catch (const std::invalid_argument& fault) {
            EXPECT_NE(std::string(fault.what()).find(why), std::string::npos) << text << ": " << fault.what();
        }
    }
}

TEST(CongestionControl, RefusalsNameTheAlgorithmAndWhatTheKernelAllowsInTheHostsNames) {
    EXPECT_EQ(KernelAlgorithm("newreno"), "reno");
    EXPECT_EQ(HostAlgorithm("reno"), "newreno");
    EXPECT_EQ(AlgorithmRefusal("glidex", "cubic", "reno bbr", "reno bbr cubic\n"),
              "Congestion-control algorithm 'cubic' is not allowed in netstack instance 'glidex': the kernel "
              "allows newreno, bbr there (net.ipv4.tcp_allowed_congestion_control)");
    EXPECT_EQ(
        AlgorithmRefusal("glidex", "cubic", "", "reno  bbr"),
        "Congestion-control algorithm 'cubic' is not available in the kernel, which offers newreno, bbr "
        "(net.ipv4.tcp_available_congestion_control)");
    EXPECT_EQ(AlgorithmRefusal("glidex", "newreno", "reno", "reno cubic"), "");
    // Lists are compared word by word: "cubicx" is not "cubic".
    EXPECT_NE(AlgorithmRefusal("glidex", "cubic", "reno cubicx", "reno cubic"), "");
}

}  // namespace

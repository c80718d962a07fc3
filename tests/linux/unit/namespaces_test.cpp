// Netstacks of the Linux host without a kernel: namespace names, what the host's document keeps
// of netstacks, and how congestion-control algorithms are named and refused.
#include <gtest/gtest.h>

#include <stdexcept>

#include <nlohmann/json.hpp>

#include "kernel/namespaces.h"
#include "network/netstack.h"

namespace {

using namespace TknCtl::Linux;
using nlohmann::json;

TEST(NamespaceNames, AreFileNamesOfRunNetns) {
    for (const char* good : {"glidex", "a", "faultTolerance", "x.y-z_1"})
        EXPECT_TRUE(Kernel::IsNamespaceName(good)) << good;
    for (const std::string& bad : std::vector<std::string>{"", ".", "..", "a/b", "../etc",
                                                           std::string("a\0b", 3), std::string(256, 'n')})
        EXPECT_FALSE(Kernel::IsNamespaceName(bad)) << bad;
    EXPECT_FALSE(Kernel::NamedNamespaceExists("../../etc/passwd"));
}

TEST(NetstackRecords, ReadAndWrittenBack) {
    json member = json::parse(R"({
        "glidex": {"name": "Glidex stack"},
        "backup": {"name": "backup", "disabled": true, "maxConnections": 3000,
                   "congestionControl": "cubic", "ipv6Enabled": false},
        "ft": {"disabled": true, "maxConnections": 11000, "congestionControl": "newreno", "ipv6Enabled": true}
    })");
    auto records = ParseNetstackRecords(member);
    ASSERT_EQ(records.size(), 3u);
    EXPECT_EQ(records["glidex"].name, "Glidex stack");
    EXPECT_FALSE(records["glidex"].disabled);
    EXPECT_TRUE(records["backup"].disabled);
    EXPECT_EQ(records["backup"].maxConnections, 3000u);
    EXPECT_EQ(records["backup"].congestionControl, "cubic");
    EXPECT_FALSE(records["backup"].ipv6Enabled);
    EXPECT_EQ(records["ft"].name, "");
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
        {R"({"a/b": {}})", "'a/b': no name a namespace can have"},
        {R"({"..": {}})", "'..': no name a namespace can have"},
        {R"({"a": {"name": 7}})", "'a': member 'name' is unknown or of the wrong type"},
        {R"({"a": {"colour": "red"}})", "'a': member 'colour' is unknown"},
        {R"({"a": {"disabled": "yes"}})", "member 'disabled'"},
        {R"({"a": {"disabled": true, "maxConnections": -1, "congestionControl": "cubic", "ipv6Enabled": true}})",
         "member 'maxConnections'"},
        {R"({"a": {"disabled": true, "maxConnections": 4294967296, "congestionControl": "cubic",
                   "ipv6Enabled": true}})",
         "member 'maxConnections'"},
        {R"({"a": {"disabled": true, "maxConnections": 5, "congestionControl": "", "ipv6Enabled": true}})",
         "member 'congestionControl'"},
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

TEST(CongestionControl, RenoIsNewrenoToTheHost) {
    EXPECT_EQ(KernelAlgorithm("newreno"), "reno");
    EXPECT_EQ(KernelAlgorithm("cubic"), "cubic");
    EXPECT_EQ(HostAlgorithm("reno"), "newreno");
    EXPECT_EQ(HostAlgorithm("bbr"), "bbr");
    EXPECT_EQ(HostAlgorithm(""), "");
    EXPECT_EQ(HostAlgorithmList("reno bbr  cubic\n"), "newreno, bbr, cubic");
    EXPECT_EQ(HostAlgorithmList(""), "none");
}

TEST(CongestionControl, RefusalsNameTheAlgorithmAndWhatTheKernelAllows) {
    EXPECT_EQ(AlgorithmRefusal("glidex", "cubic", "reno bbr", "reno bbr cubic"),
              "Congestion-control algorithm 'cubic' is not allowed in netstack instance 'glidex': the kernel "
              "allows newreno, bbr there (net.ipv4.tcp_allowed_congestion_control)");
    EXPECT_EQ(
        AlgorithmRefusal("glidex", "cubic", "reno", "reno bbr"),
        "Congestion-control algorithm 'cubic' is not available in the kernel, which offers newreno, bbr "
        "(net.ipv4.tcp_available_congestion_control)");
    EXPECT_EQ(AlgorithmRefusal("glidex", "newreno", "reno", "reno cubic"), "");
    EXPECT_EQ(AlgorithmRefusal("glidex", "cubic", "reno cubic", "reno cubic"), "");
    // "cubicx" is not "cubic": lists are compared word by word.
    EXPECT_NE(AlgorithmRefusal("glidex", "cubic", "reno cubicx", "reno cubic"), "");
}

}  // namespace

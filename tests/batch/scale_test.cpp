// The generated scale host, and rolling a session back to its last commit (what a batch line
// that ends in an unexpected failure relies on).
#include <map>
#include <nlohmann/json.hpp>
#include <sstream>
#include <vector>

#include "core/section.h"
#include "generate.h"
#include "harness.h"
#include "model/dns.h"

namespace {

using Hadro::Test::CommandTest;
using nlohmann::json;

class ScaleHost : public CommandTest {};

std::size_t Count(const json& list) {
    return list.size();
}

TEST_F(ScaleHost, HoldsTheCountsOfScaleOneWithinTheHostsLimits) {
    const json doc = json::parse(Hadro::Sim::GenerateHost(1));
    EXPECT_EQ(Count(doc["tknnics"]), 256u);
    std::size_t groups = 0, ports = 0, switchPorts = 0, dvPorts = 0, rules = 0, connections = 0,
                neighbours = 0, routes = 0, vms = 0;
    for (const auto& s : doc["vswitches"]) {
        groups += s["portGroups"].size();
        switchPorts += s["numPorts"].get<std::size_t>();
    }
    for (const auto& s : doc["dvswitches"]) {
        ports += s["ports"].size();
        dvPorts += s["numPorts"].get<std::size_t>();
    }
    for (const auto& r : doc["firewall"]["rulesets"])
        rules += r["rules"].size();
    for (const auto& n : doc["connections"])
        connections += n["connections"].size();
    for (const auto& n : doc["neighbors"])
        neighbours += n["ipv4"].size() + n["ipv6"].size();
    for (const auto& n : doc["routes"])
        routes += n["ipv4"].size() + n["ipv6"].size();
    for (const auto& w : doc["worlds"])
        vms += w["name"].get<std::string>().rfind("vmm0:", 0) == 0;
    EXPECT_EQ(doc["vswitches"].size(), 2u + 64);
    EXPECT_GE(groups, 1024u);
    EXPECT_EQ(doc["dvswitches"].size(), 1u + 16);
    EXPECT_GE(ports, 4096u);
    EXPECT_LE(switchPorts + dvPorts, 4608u);  // the host's limit
    EXPECT_GE(vms, 1000u);
    EXPECT_GE(doc["firewall"]["rulesets"].size(), 200u);
    EXPECT_GE(rules, 2000u);
    EXPECT_GE(connections, 10000u);
    EXPECT_GE(neighbours, 5000u);
    EXPECT_GE(routes, 2000u);
    // The same scale gives the same host.
    EXPECT_EQ(Hadro::Sim::GenerateHost(0.5), Hadro::Sim::GenerateHost(0.5));
}

// Every scale from small to beyond the host's limits gives a document the host accepts whole.
#if defined(__has_feature)
#if __has_feature(address_sanitizer)
#define HADRO_UNDER_SANITIZER 1
#endif
#endif
#if defined(__SANITIZE_ADDRESS__)
#define HADRO_UNDER_SANITIZER 1
#endif

TEST_F(ScaleHost, EveryScaleLoads) {
#ifdef HADRO_UNDER_SANITIZER
    // The sanitizers make the largest hosts slow to build and check; the release run has them.
    const std::vector<double> scales = {0.01, 0.05, 0.25, 1.0};
#else
    const std::vector<double> scales = {0.01, 0.05, 0.25, 1.0, 2.0, 4.0};
#endif
    for (double scale : scales) {
        EXPECT_NO_THROW(
            HostCtl::Lib::HostSession::ValidateDocument(Hadro::Sim::GenerateHost(scale), "generated"))
            << scale;
    }
}

// Every list command runs on a generated host (given the arguments some of them need).
TEST_F(ScaleHost, EveryListCommandSucceeds) {
    UseHost(Hadro::Sim::GenerateHost(0.25));
    const std::map<std::string, std::string> arguments = {
        {"network ip interface ipv4 address list", ""},
        {"network ip interface ipv6 address list", ""},
        {"network firewall ruleset rule list", " --ruleset-id service0007"},
        {"network firewall ruleset allowedip list", " --ruleset-id service0003"},
        {"network vm port list", " --world-id 3000007"},
        {"network sriovnic vf list", " --nic-name vmnic5"},
        {"network nic queue loadbalancer state list", ""},
    };
    std::istringstream commands(Run("--list-commands").out);
    int lists = 0;
    for (std::string line; std::getline(commands, line);) {
        std::string path = line.substr(0, line.find('\t'));
        if (path.size() < 5 || path.compare(path.size() - 5, 5, " list") != 0) continue;
        ++lists;
        auto found = arguments.find(path);
        auto r = Run(path + (found == arguments.end() ? "" : found->second));
        EXPECT_EQ(r.status, 0) << path << "\n" << r.err;
    }
    EXPECT_GE(lists, 30);
    // The generated entities are there to be found.
    EXPECT_NE(Run("network vm list").out.find("vm-00249"), std::string::npos);
    EXPECT_NE(Run("network ip interface list").out.find("tkn63"), std::string::npos);
}

using Rollback = CommandTest;

TEST_F(Rollback, ForgetsChangesSinceTheLastCommit) {
    using TknCtl::Lib::Read;
    using TknCtl::Model::DnsSection;
    ASSERT_EQ(Run("network ip dns search add -d one.example").status, 0);
    session_->Commit();
    const std::string committed = Export();
    ASSERT_EQ(Run("network ip dns search add -d two.example").status, 0);
    ASSERT_EQ(Run("network vswitch standard portgroup add -p Lab -v vSwitch1").status, 0);
    session_->Rollback();
    EXPECT_FALSE(session_->HasChanges());
    EXPECT_EQ(Export(), committed);
    auto list = Run("network ip dns search list").out;
    EXPECT_NE(list.find("one.example"), std::string::npos);
    EXPECT_EQ(list.find("two.example"), std::string::npos);
    // Work goes on from the committed state.
    EXPECT_EQ(Run("network vswitch standard portgroup add -p Lab -v vSwitch1").status, 0);
    EXPECT_TRUE(session_->HasChanges());
}

}  // namespace

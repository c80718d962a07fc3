// "network nic queue" load balancer settings, state, plugins, counts and filter classes.
#include <nlohmann/json.hpp>

#include "harness.h"

namespace {

using nlohmann::json;

class NicQueueTest : public Hadro::Test::CommandTest {
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
    json Netqueue(const std::string& name) {
        for (const auto& nic : Section("pnics"))
            if (nic["name"] == name) return nic["netqueue"];
        return json();
    }
    static std::vector<std::string> Names(const json& list) {
        std::vector<std::string> names;
        for (const auto& entry : list)
            names.push_back(entry["NIC"]);
        return names;
    }
};

const std::vector<std::string> kWithNetqueue{"vmnic0", "vmnic1", "vmnic2", "vmnic3", "vmnic5", "vmnic6"};

TEST_F(NicQueueTest, LoadBalancerSettingLetters) {
    auto list = Json("network nic queue loadbalancer list");
    EXPECT_EQ(Names(list), kWithNetqueue);  // the USB adapter has no netqueue: skipped silently
    EXPECT_EQ(list[0], json::parse(R"({"NIC":"vmnic0","RxQPair":"SA","RxQNoFeature":"ND","PreEmptibleQ":"UD",
        "RxQLatency":"UD","RxDynamicLB":"ND","DynamicQPool":"SA","MacLearnLB":"ND","RSS":"SA","LRO":"SD",
        "GeneveOAM":"SD"})"));
    // The device has no say in three features: their first letter is N whatever it declares.
    EditHost([](json& doc) {
        for (auto& feature : doc["pnics"][0]["netqueue"]["features"])
            feature = {{"supported", true}, {"allowed", true}};
    });
    EXPECT_EQ(Json("network nic queue loadbalancer list")[0], json::parse(R"({"NIC":"vmnic0","RxQPair":"SA",
        "RxQNoFeature":"NA","PreEmptibleQ":"SA","RxQLatency":"SA","RxDynamicLB":"NA","DynamicQPool":"SA",
        "MacLearnLB":"NA","RSS":"SA","LRO":"SA","GeneveOAM":"SA"})"));
}

TEST_F(NicQueueTest, LoadBalancerSet) {
    StartJournal();
    EXPECT_EQ(Json("network nic queue loadbalancer set -n vmnic0"), true);
    EXPECT_TRUE(Journal("HostCtl::Network::Pnic::SetNetqueueInfo").empty());
    EXPECT_EQ(Json("network nic queue loadbalancer set -n vmnic0 --rsslb false"), true);
    EXPECT_EQ(
        Json("network nic queue loadbalancer set -n vmnic0 --lrolb true --rxqnofeat true --geneveoamlb no"),
        true);
    EXPECT_EQ(
        Journal("HostCtl::Network::Pnic::SetNetqueueInfo"),
        (std::vector<std::string>{
            "HostCtl::Network::Pnic::SetNetqueueInfo vmnic0 lb=rss=false",
            "HostCtl::Network::Pnic::SetNetqueueInfo vmnic0 lb=rxQNoFeature=true,lro=true,geneveOam=false"}));
    auto features = Netqueue("vmnic0")["features"];
    EXPECT_EQ(features["rss"], json::parse(R"({"supported":true,"allowed":false})"));
    EXPECT_EQ(features["lro"]["allowed"], true);
    EXPECT_EQ(features["rxQNoFeature"]["allowed"], true);
    EXPECT_EQ(features["rxQPair"]["allowed"], true);  // not given: kept
    EXPECT_EQ(Json("network nic queue loadbalancer list")[0]["RSS"], "SD");

    EXPECT_EQ(Error("network nic queue loadbalancer set -n vmnic0 --rxqpreempt true"),
              "vmnic0 does not support the netqueue load balancer feature preEmptibleQ");
    EXPECT_EQ(Json("network nic queue loadbalancer set -n vmnic0 --rxqpreempt false"), true);
    EXPECT_EQ(Error("network nic queue loadbalancer set -n vmnic9 --rsslb true"),
              "Pnic with name vmnic9 not found");
    EXPECT_EQ(Error("network nic queue loadbalancer set -n vmnic4 --rsslb true"),
              "vmnic4 does not support netqueue (driver usbnet)");
}

TEST_F(NicQueueTest, BalancerState) {
    auto list = Json("network nic queue loadbalancer state list");
    EXPECT_EQ(Names(list), kWithNetqueue);
    EXPECT_EQ(list[3], json::parse(R"({"NIC":"vmnic3","Enabled":false})"));
    EXPECT_EQ(Json("network nic queue loadbalancer state set -n vmnic3 -e true"), true);
    EXPECT_EQ(Json("network nic queue loadbalancer state list -n vmnic3"),
              json::parse(R"([{"NIC":"vmnic3","Enabled":true}])"));
    EXPECT_EQ(Json("network nic queue loadbalancer state set -n vmnic3 --enable false"), true);
    EXPECT_EQ(Netqueue("vmnic3")["balancerEnabled"], false);

    EXPECT_EQ(Error("network nic queue loadbalancer state list -n vmnic9"), "Invalid PNIC name vmnic9");
    EXPECT_EQ(Error("network nic queue loadbalancer state set -n vmnic9 -e true"),
              "Invalid PNIC name vmnic9");
    // A named adapter that cannot report is an error; unnamed, it is skipped.
    EXPECT_EQ(Error("network nic queue loadbalancer state list -n vmnic4"),
              "vmnic4 does not support netqueue (driver usbnet)");
    AddFault("HostCtl::Network::Pnic::GetNetqueueInfo", "vmnic1", "queue table busy");
    EXPECT_EQ(Names(Json("network nic queue loadbalancer state list")),
              (std::vector<std::string>{"vmnic0", "vmnic2", "vmnic3", "vmnic5", "vmnic6"}));
    EXPECT_EQ(Error("network nic queue loadbalancer state list --vmnic vmnic1"), "queue table busy");
}

TEST_F(NicQueueTest, Plugins) {
    auto list = Json("network nic queue loadbalancer plugin list -n vmnic5");
    ASSERT_EQ(list.size(), 4u);
    EXPECT_EQ(list[0],
              json::parse(R"({"NIC":"vmnic5","Module Name":"load-based-netq","Plugin Name":"rss-balancer",
        "Enabled":true,"Description":"Spreads RX queues of heavy flows across receive-side scaling engines"})"));
    EXPECT_EQ(list[1]["Enabled"], false);
    EXPECT_EQ(list[2]["Enabled"], true);
    // The same plugin name in another module is another plugin.
    EXPECT_EQ(list[3]["Module Name"], "numa-netq");
    EXPECT_EQ(list[3]["Plugin Name"], "rss-balancer");
    EXPECT_EQ(list[3]["Enabled"], false);
    // Adapters without plugins add nothing.
    EXPECT_EQ(Json("network nic queue loadbalancer plugin list -n vmnic2"), json::array());
    EXPECT_EQ(Json("network nic queue loadbalancer plugin list").size(), 13u);
    auto table = Run("network nic queue loadbalancer plugin list -n vmnic2");
    EXPECT_EQ(table.status, 0);

    StartJournal();
    EXPECT_EQ(
        Json("network nic queue loadbalancer plugin set -n vmnic5 -e true -m numa-netq -p rss-balancer"),
        true);
    EXPECT_EQ(
        Journal("HostCtl::Network::Pnic::SetNetqueueInfo"),
        std::vector<std::string>{
            "HostCtl::Network::Pnic::SetNetqueueInfo vmnic5 plugin=numa-netq/rss-balancer enabled=true"});
    EXPECT_EQ(Json("network nic queue loadbalancer plugin list -n vmnic5")[3]["Enabled"], true);
    EXPECT_EQ(Json("network nic queue loadbalancer plugin set -n vmnic5 -e false -m load-based-netq -p "
                   "rss-balancer"),
              true);
    EXPECT_EQ(Json("network nic queue loadbalancer plugin list -n vmnic5")[0]["Enabled"], false);

    EXPECT_EQ(
        Error(
            "network nic queue loadbalancer plugin set -n vmnic5 -e true -m numa-netq -p latency-sensitive"),
        "vmnic5 has no netqueue balancer plugin latency-sensitive in module numa-netq");
    EXPECT_EQ(Error("network nic queue loadbalancer plugin set -n vmnic9 -e true -m a -p b"),
              "Invalid PNIC name vmnic9");
    EXPECT_EQ(Error("network nic queue loadbalancer plugin list -n vmnic9"), "Invalid PNIC name vmnic9");
    EXPECT_EQ(Run("network nic queue loadbalancer plugin set -n vmnic5 -e true -m numa-netq").status, 2);
}

TEST_F(NicQueueTest, Counts) {
    auto list = Json("network nic queue count get");
    EXPECT_EQ(Names(list), kWithNetqueue);
    EXPECT_EQ(list[2], json::parse(R"({"NIC":"vmnic2","Tx netqueue count":1,"Rx netqueue count":4})"));

    StartJournal();
    EXPECT_EQ(Json("network nic queue count set -n vmnic0 --tx true --num 8"), true);
    EXPECT_EQ(Json("network nic queue count set -n vmnic0 --tx false --num 4"),
              true);  // the value is not looked at
    EXPECT_EQ(Json("network nic queue count get -n vmnic0"),
              json::parse(R"([{"NIC":"vmnic0","Tx netqueue count":4,"Rx netqueue count":8}])"));
    EXPECT_EQ(Json("network nic queue count set -n vmnic0 -t true -r true -q 16"), true);
    EXPECT_EQ(Json("network nic queue count get -n vmnic0")[0]["Rx netqueue count"], 16);
    EXPECT_EQ(Json("network nic queue count set -n vmnic0 -q 3"), true);  // neither direction: nothing sent
    EXPECT_EQ(Journal("HostCtl::Network::Pnic::SetNetqueueInfo"),
              (std::vector<std::string>{"HostCtl::Network::Pnic::SetNetqueueInfo vmnic0 tx=8",
                                        "HostCtl::Network::Pnic::SetNetqueueInfo vmnic0 tx=4",
                                        "HostCtl::Network::Pnic::SetNetqueueInfo vmnic0 tx=16 rx=16"}));

    EXPECT_EQ(Error("network nic queue count set -n vmnic0 -r true -q 17"),
              "RX netqueue count 17 is out of range for vmnic0 (1 to 16)");
    EXPECT_EQ(Error("network nic queue count set -n vmnic0 -t true"),
              "TX netqueue count 0 is out of range for vmnic0 (1 to 16)");
    EXPECT_EQ(Error("network nic queue count set -n vmnic0 -t true -q -1"),
              "Invalid value -1 for --num: expected a number from 0 to 4294967295.");
    EXPECT_EQ(Error("network nic queue count get -n vmnic9"), "Pnic with name vmnic9 not found");
    EXPECT_EQ(Error("network nic queue count set -n vmnic9 -t true -q 1"), "Pnic with name vmnic9 not found");
}

TEST_F(NicQueueTest, FilterClasses) {
    auto list = Json("network nic queue filterclass list");
    EXPECT_EQ(Names(list), kWithNetqueue);
    EXPECT_EQ(list[2], json::parse(R"({"NIC":"vmnic2","MacOnly":true,"VlanOnly":false,"VlanMac":true,
        "Vxlan":false,"Geneve":false,"GenericEncap":false})"));
    EditHost([](json& doc) { doc["pnics"][2]["netqueue"]["filterClasses"]["genericEncap"] = true; });
    EXPECT_EQ(Json("network nic queue filterclass list")[2]["GenericEncap"], true);
}

TEST_F(NicQueueTest, HostFailures) {
    AddFault("TknCtl::Network::NetworkInfoImpl::GetPnics", "", "no adapters");
    for (const char* listing : {"loadbalancer list", "loadbalancer state list", "loadbalancer plugin list",
                                "count get", "filterclass list"})
        EXPECT_EQ(Error(std::string("network nic queue ") + listing), "no adapters") << listing;
    AddFault("HostCtl::Network::Pnic::SetNetqueueInfo", "vmnic0", "firmware busy");
    for (const char* change :
         {"loadbalancer set -n vmnic0 --rsslb true", "loadbalancer state set -n vmnic0 -e true",
          "loadbalancer plugin set -n vmnic0 -e true -m numa-netq -p numa-affinity",
          "count set -n vmnic0 -t true -q 2"})
        EXPECT_EQ(Error(std::string("network nic queue ") + change), "firmware busy") << change;
    AddFault("HostCtl::Network::Pnic::GetNetqueueInfo", "vmnic0", "queue table busy");
    EXPECT_EQ(Error("network nic queue count get -n vmnic0"), "queue table busy");
    EXPECT_EQ(Error("network nic queue loadbalancer plugin list -n vmnic0"), "queue table busy");
}

}  // namespace

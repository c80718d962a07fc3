// "network vm list" and "network vm port list" on fixture hosts.
#include <algorithm>

#include "dvs_test.h"

namespace Hadro::Test {
namespace {

using Strings = std::vector<std::string>;

class VmTest : public DvsTest {
protected:
    // The VM list ordered by World ID (the command's own order is not defined).
    nlohmann::json SortedVms() {
        auto vms = Json("network vm list");
        std::sort(vms.begin(), vms.end(), [](const nlohmann::json& a, const nlohmann::json& b) {
            return a["World ID"] < b["World ID"];
        });
        return vms;
    }
    static void RenameWorld(nlohmann::json& doc, unsigned id, const std::string& name) {
        for (auto& world : doc["worlds"]) {
            if (world["id"] == id) world["name"] = name;
        }
    }
};

TEST_F(VmTest, ListsVmsWithTheirNetworks) {
    // Standard port groups by name (twice for two ports), distributed port groups by ID.
    EXPECT_EQ(SortedVms(), nlohmann::json::parse(R"([
        {"World ID":2110231,"Name":"web-01","Num Ports":2,"Networks":["VM Network","VM Network"]},
        {"World ID":2110598,"Name":"db-01","Num Ports":1,"Networks":["dvportgroup-21"]},
        {"World ID":2111002,"Name":"app-01","Num Ports":2,"Networks":["VM Network","dvportgroup-21"]}])"));
}

TEST_F(VmTest, WorldNamesWithoutTheirPrefix) {
    EditHost([](nlohmann::json& doc) {
        RenameWorld(doc, 2110231, "vmm0");   // shorter than the prefix
        RenameWorld(doc, 2110598, "vmm0:");  // the prefix alone
        RenameWorld(doc, 2111002, "vmm0:x");
    });
    auto vms = SortedVms();
    ASSERT_EQ(vms.size(), 3u);
    EXPECT_EQ(vms[0]["Name"], "");
    EXPECT_EQ(vms[1]["Name"], "");
    EXPECT_EQ(vms[2]["Name"], "x");
}

TEST_F(VmTest, HostWithoutVms) {
    EditHost([](nlohmann::json& doc) {
        for (auto& port : doc["ports"]) {
            if (port["type"] == "vm") port["type"] = "internal";
            port["worldId"] = 0;
        }
    });
    auto r = Run("--formatter=json network vm list");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, "[]\n");
    r = Run("--formatter=json network vm port list -w 2110231");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, "[]\n");
}

TEST_F(VmTest, PortsOfAVmOnAStandardSwitch) {
    auto r = Run("network vm port list -w 2110231");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out,
              "Port ID: 33554437\n"
              "vSwitch: vSwitch0\n"
              "Portgroup: VM Network\n"
              "DVPort ID: \n"
              "MAC Address: 02:48:44:01:00:01\n"
              "IP Address: 192.0.2.101\n"
              "Team Uplink: vmnic0\n"
              "Uplink Port ID: 33554434\n"
              "Active Filters: hadro-fw\n"
              "\n"
              "Port ID: 33554438\n"
              "vSwitch: vSwitch0\n"
              "Portgroup: VM Network\n"
              "DVPort ID: \n"
              "MAC Address: 02:48:44:01:00:02\n"
              "IP Address: 192.0.2.102\n"
              "Team Uplink: vmnic0\n"
              "Uplink Port ID: 33554434\n"
              "Active Filters: hadro-fw\n");
}

TEST_F(VmTest, PortsOfAVmOnBothSwitchKinds) {
    auto ports = Json("network vm port list --world-id 2111002");
    ASSERT_EQ(ports.size(), 2u);
    EXPECT_EQ(ports[0]["vSwitch"], "vSwitch0");
    EXPECT_EQ(ports[1], nlohmann::json::parse(R"({"Port ID":67108869,"vSwitch":"dvs-prod",
        "Portgroup":"dvportgroup-21","DVPort ID":"11","MAC Address":"02:48:44:03:00:02","IP Address":"203.0.113.61",
        "Team Uplink":"vmnic5","Uplink Port ID":67108867,"Active Filters":[]})"));
}

TEST_F(VmTest, ActiveFiltersOncePerName) {
    EditHost([](nlohmann::json& doc) {
        auto& filters = PortById(doc, 67108868)["filters"];
        filters.push_back({{"name", "ids-tap"}, {"valid", true}, {"direction", true}});
        filters.push_back({{"name", "mirror"}, {"valid", false}});
        filters.push_back({{"name", "qos"}, {"valid", true}});
    });
    auto ports = Json("network vm port list -w 2110598");
    ASSERT_EQ(ports.size(), 1u);
    EXPECT_EQ(ports[0]["Active Filters"], nlohmann::json({"ids-tap", "hadro-fw", "qos"}));
}

TEST_F(VmTest, TeamUplinkFollowsTheSwitch) {
    // The NIC recorded for the port has left the switch: traffic leaves by the switch's uplink.
    EditHost([](nlohmann::json& doc) { PortById(doc, 33554438)["teamUplink"] = "vmnic2"; });
    auto ports = Json("network vm port list -w 2110231");
    ASSERT_EQ(ports.size(), 2u);
    EXPECT_EQ(ports[1]["Team Uplink"], "vmnic0");
    EXPECT_EQ(ports[1]["Uplink Port ID"], 33554434);

    // A port without a team uplink.
    EditHost([](nlohmann::json& doc) { PortById(doc, 33554438)["teamUplink"] = ""; });
    ports = Json("network vm port list -w 2110231");
    EXPECT_EQ(ports[1]["Team Uplink"], "");
    EXPECT_EQ(ports[1]["Uplink Port ID"], 0);
}

TEST_F(VmTest, UnknownWorld) {
    // Nobody's ports, and a VM's ID plus 2^32 (never wrapped onto that VM).
    for (const char* id : {"42", "0", "-1", "4297077527"}) {
        auto r = Run(std::string("--formatter=json network vm port list -w ") + id);
        EXPECT_EQ(r.status, 0) << id;
        EXPECT_EQ(r.out, "[]\n") << id;
    }
}

TEST_F(VmTest, HostFailures) {
    AddFault("TknCtl::Resource::WorldImpl::GetWorldName", "2110598", "world table busy");
    auto r = Run("network vm list");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"Unable to list VM's: world table busy"});

    AddFault("HostCtl::Network::Port::GetFilterStats", "67108868", "filter module not loaded");
    r = Run("network vm port list -w 2110598");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"Unable to list ports for VM: filter module not loaded"});

    AddFault("TknCtl::Network::DVPortImpl::GetDVPortgroupId", "11", "port 11 is locked");
    EXPECT_EQ(Run("network vm port list -w 2111002").Errors(),
              Strings{"Unable to list ports for VM: port 11 is locked"});
}

}  // namespace
}  // namespace Hadro::Test

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
};

TEST_F(VmTest, ListsVmsWithTheirNetworks) {
    // Standard port groups by name (once per port), distributed port groups by ID.
    EXPECT_EQ(SortedVms(), nlohmann::json::parse(R"([
        {"World ID":2110231,"Name":"web-01","Num Ports":2,"Networks":["VM Network","VM Network"]},
        {"World ID":2110598,"Name":"db-01","Num Ports":1,"Networks":["dvportgroup-21"]},
        {"World ID":2111002,"Name":"app-01","Num Ports":2,"Networks":["VM Network","dvportgroup-21"]}])"));

    // Names shorter than the "vmm0:" prefix, the prefix alone.
    EditHost([](nlohmann::json& doc) {
        doc["worlds"][6]["name"] = "vmm0";
        doc["worlds"][7]["name"] = "vmm0:";
        doc["worlds"][8]["name"] = "vmm0:x";
    });
    auto vms = SortedVms();
    EXPECT_EQ(vms[0]["Name"], "");
    EXPECT_EQ(vms[1]["Name"], "");
    EXPECT_EQ(vms[2]["Name"], "x");

    // No VM has a port.
    EditHost([](nlohmann::json& doc) {
        for (auto& port : doc["ports"]) {
            if (port["type"] == "vm") port["type"] = "internal";
            port["worldId"] = 0;
        }
    });
    EXPECT_EQ(Json("network vm list"), nlohmann::json::array());
    EXPECT_EQ(Json("network vm port list -w 2110231"), nlohmann::json::array());
}

TEST_F(VmTest, PortsOfAVm) {
    auto r = Run("network vm port list -w 2110231");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out.rfind("Port ID: 33554437\nvSwitch: vSwitch0\nPortgroup: VM Network\nDVPort ID: \n", 0),
              0u)
        << r.out;
    // The same filter in both directions once, an invalid one not at all.
    EXPECT_NE(
        r.out.find(
            "Team Uplink: vmnic0\nUplink Port ID: 33554434\nActive Filters: hadro-fw\n\nPort ID: 33554438"),
        std::string::npos)
        << r.out;

    auto ports = Json("network vm port list --world-id 2111002");
    ASSERT_EQ(ports.size(), 2u);
    EXPECT_EQ(ports[1], nlohmann::json::parse(R"({"Port ID":67108869,"vSwitch":"dvs-prod",
        "Portgroup":"dvportgroup-21","DVPort ID":"11","MAC Address":"02:48:44:03:00:02","IP Address":"203.0.113.61",
        "Team Uplink":"vmnic5","Uplink Port ID":67108867,"Active Filters":[]})"));

    // Nobody's ports, and a VM's ID plus 2^32 (never wrapped onto that VM).
    for (const char* id : {"42", "0", "-1", "4297077527"})
        EXPECT_EQ(Json(std::string("network vm port list -w ") + id), nlohmann::json::array()) << id;
}

TEST_F(VmTest, TeamUplinkFollowsTheSwitch) {
    // The NIC recorded for the port is no uplink of its switch: traffic leaves by the switch's.
    EditHost([](nlohmann::json& doc) {
        PortById(doc, 33554437)["teamUplink"] = "vmnic2";
        PortById(doc, 33554438)["teamUplink"] = "";
    });
    auto ports = Json("network vm port list -w 2110231");
    EXPECT_EQ(ports[0]["Team Uplink"], "vmnic0");
    EXPECT_EQ(ports[0]["Uplink Port ID"], 33554434);
    EXPECT_EQ(ports[1]["Team Uplink"], "");
    EXPECT_EQ(ports[1]["Uplink Port ID"], 0);
}

TEST_F(VmTest, HostFailures) {
    AddFault("TknCtl::Resource::WorldImpl::GetWorldName", "2110598", "world table busy");
    auto r = Run("network vm list");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"Unable to list VM's: world table busy"});

    AddFault("TknCtl::Network::DVPortImpl::GetDVPortgroupId", "11", "port 11 is locked");
    r = Run("network vm port list -w 2111002");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"Unable to list ports for VM: port 11 is locked"});
}

}  // namespace
}  // namespace Hadro::Test

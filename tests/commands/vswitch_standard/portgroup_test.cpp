// Port groups: list, add, remove and VLAN.
#include "vswitch_test.h"

namespace Hadro::Test {
namespace {

using nlohmann::json;
using Lines = std::vector<std::string>;

class PortGroupTest : public VswitchTest {};

TEST_F(PortGroupTest, ListShowsEveryPortGroupAsATable) {
    auto r = Run("network vswitch standard portgroup list");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out,
              "Name                Virtual Switch  Active Clients  VLAN ID\n"
              "------------------  --------------  --------------  -------\n"
              "Management Network  vSwitch0        1               0\n"
              "VM Network          vSwitch0        3               0\n"
              "Migration           vSwitch1        1               20\n");

    UseHost(R"({"version":1,"vswitches":[{"name":"vSwitch0"}]})");
    r = Run("--formatter=json network vswitch standard portgroup list");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, "[]\n");
    EXPECT_EQ(r.err, "");
}

TEST_F(PortGroupTest, AddAndRemove) {
    auto r = Run("network vswitch standard portgroup add -p 'Backup Net' -v vSwitch1");
    EXPECT_EQ(r.status, 0) << r.err;
    auto list = Json("network vswitch standard portgroup list");
    ASSERT_EQ(list.size(), 4u);
    EXPECT_EQ(list[3], json::parse(R"({"Name":"Backup Net","Virtual Switch":"vSwitch1","Active Clients":0,
        "VLAN ID":0})"));
    // A new port group overrides nothing.
    EXPECT_EQ(
        Json("network vswitch standard portgroup policy failover get -p 'Backup Net'")["Load Balancing"],
        "srcport");

    r = Run("network vswitch standard portgroup remove -p 'Backup Net' -v vSwitch1");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(Json("network vswitch standard portgroup list").size(), 3u);
}

TEST_F(PortGroupTest, AddKeepsTheHostsRules) {
    struct Case {
        const char* line;
        const char* message;
    };
    for (const Case& c : std::vector<Case>{
             {"-p Migration -v vSwitch0",
              "Unable to add port group Migration: virtual switch vSwitch1 already has a port group of that "
              "name"},
             {"-p Lab -v vSwitch9", "Virtual switch vSwitch9 does not exist"},
             {"-p '' -v vSwitch0", "Unable to add port group: the name is empty"},
             {"-p ' Lab' -v vSwitch0",
              "Unable to add port group ' Lab': a name holds only printable characters and neither starts "
              "nor ends "
              "with a blank"},
             // The message escapes the tab: text on the terminal never carries control characters.
             {"-p 'Lab\tNet' -v vSwitch0",
              "Unable to add port group 'Lab\\tNet': a name holds only printable characters and neither "
              "starts nor "
              "ends with a blank"},
             {"-p Port-group-with-a-name-that-runs-on-to-sixty-characters-long -v vSwitch0",
              "Unable to add port group Port-group-with-a-name-that-runs-on-to-sixty-characters-long: the "
              "name is "
              "longer than 59 characters"},
         }) {
        auto r = Run(std::string("network vswitch standard portgroup add ") + c.line);
        EXPECT_EQ(r.status, 1) << c.line;
        EXPECT_EQ(r.Errors(), Lines{c.message}) << c.line;
    }
    EXPECT_EQ(Json("network vswitch standard portgroup list").size(), 3u);
}

TEST_F(PortGroupTest, RemoveIsRefusedWhileInUseOrElsewhere) {
    struct Case {
        const char* line;
        const char* message;
    };
    for (const Case& c : std::vector<Case>{
             {"-p 'Management Network' -v vSwitch0",
              "Unable to remove port group Management Network from virtual switch vSwitch0: Tarkon interface "
              "tkn0 is "
              "connected to it"},
             {"-p 'VM Network' -v vSwitch0",
              "Unable to remove port group VM Network from virtual switch vSwitch0: 3 virtual machine "
              "port(s) use it"},
             {"-p Migration -v vSwitch0",
              "Unable to remove port group Migration from virtual switch vSwitch0: the switch has no such "
              "port group"},
             {"-p Lab -v vSwitch9", "Virtual switch vSwitch9 does not exist"},
         }) {
        auto r = Run(std::string("network vswitch standard portgroup remove ") + c.line);
        EXPECT_EQ(r.status, 1) << c.line;
        EXPECT_EQ(r.Errors(), Lines{c.message}) << c.line;
    }
    EXPECT_EQ(Json("network vswitch standard portgroup list").size(), 3u);
}

TEST_F(PortGroupTest, SetChangesTheVlanOnlyWhenGiven) {
    auto r = Run("network vswitch standard portgroup set -p 'VM Network' --vlan-id 4095");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(Json("network vswitch standard portgroup list")[1]["VLAN ID"], 4095);

    const std::string before = Export();
    r = Run("network vswitch standard portgroup set -p Migration");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(Export(), before);
    EXPECT_EQ(Json("network vswitch standard portgroup list")[2]["VLAN ID"], 20);

    r = Run("network vswitch standard portgroup set -p Storage -v 5");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.Errors(), Lines{"Unable to find a port group with the name Storage"});
    EXPECT_EQ(Run("network vswitch standard portgroup set -p Migration -v 4096").status, 2);
    EXPECT_EQ(Run("network vswitch standard portgroup set -p Migration -v -1").status, 2);
}

TEST_F(PortGroupTest, CommandsReportHostFailures) {
    struct Case {
        const char* operation;
        const char* target;
        const char* line;
    };
    for (const Case& c : std::vector<Case>{
             {"TknCtl::Network::NetworkInfoImpl::GetAllPortGroups", "", "portgroup list"},
             {"HostCtl::Network::VirtualSwitch::AddPortGroup", "vSwitch1",
              "portgroup add -p Lab -v vSwitch1"},
             {"HostCtl::Network::VirtualSwitch::RemovePortGroup", "vSwitch1",
              "portgroup remove -p Lab -v vSwitch1"},
             {"HostCtl::Network::PortGroup::SetVlanId", "Migration", "portgroup set -p Migration -v 7"},
             {"HostCtl::Network::NetworkFactory::GetPortGroupByName", "Migration",
              "portgroup set -p Migration"},
         }) {
        AddFault(c.operation, c.target, "port group table busy", 1);
        auto r = Run(std::string("network vswitch standard ") + c.line);
        EXPECT_EQ(r.status, 1) << c.line;
        EXPECT_EQ(r.out, "") << c.line;
        EXPECT_EQ(r.err, "port group table busy\n") << c.line;
    }
    EXPECT_EQ(Json("network vswitch standard portgroup list")[2]["VLAN ID"], 20);
}

TEST_F(PortGroupTest, HelpShowsTheComposedVlanRange) {
    auto r = Run("--formatter=json network vswitch standard portgroup set --help");
    ASSERT_EQ(r.status, 0) << r.err;
    auto help = json::parse(r.out);
    EXPECT_EQ(help["metadata"]["type"], "operator");
    EXPECT_EQ(help["parameters"][1], json::parse(R"js({"name":"vlan-id","short":"v","type":"integer","required":false,
        "description":"The vlan id for this port group. This value is in the range (0 - 4095)",
        "constraint":{
        "kind" : "range", "min" : 0, "max" : 4095}
})js"));
}

}  // namespace
}  // namespace Hadro::Test

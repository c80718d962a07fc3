// Standard switches and their uplinks: add, list, remove, set, uplink add and remove.
#include "vswitch_test.h"

namespace Hadro::Test {
namespace {

using nlohmann::json;

class SwitchTest : public VswitchTest {};

// ---------------------------------------------------------------- list

TEST_F(SwitchTest, ListShowsEverySwitchWithItsPortsUplinksAndPortGroups) {
    auto list = Json("network vswitch standard list");
    ASSERT_EQ(list.size(), 2u);
    EXPECT_EQ(list[0], json::parse(R"({"Name":"vSwitch0","Class":"etherswitch","Num Ports":128,"Used Ports":6,
        "Configured Ports":128,"MTU":1500,"CDP Status":"listen","Beacon Enabled":false,"Beacon Interval":1,
        "Beacon Threshold":3,"Beacon Required By":[],"Uplinks":["vmnic0","vmnic1"],
        "Portgroups":["Management Network","VM Network"]})"));
    EXPECT_EQ(list[1]["Name"], "vSwitch1");
    EXPECT_EQ(list[1]["MTU"], 9000);
    EXPECT_EQ(list[1]["Portgroups"], json({"Migration"}));

    auto one = Run("network vswitch standard list -v vSwitch1");
    EXPECT_EQ(one.status, 0);
    EXPECT_EQ(one.out.substr(0, 28), "vSwitch1\n   Name: vSwitch1\n ");
}

TEST_F(SwitchTest, ListOfAnUnknownNameIsEmptyWithAnError) {
    auto r = Run("--formatter=json network vswitch standard list --vswitch-name vSwitch7");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "[]\n");
    EXPECT_EQ(r.Errors(), std::vector<std::string>{"Unable to access all portsets"});
}

TEST_F(SwitchTest, ListReportsAHostFailureAlone) {
    AddFault("HostCtl::Network::VirtualSwitch::GetBeaconRequiredBy", "vSwitch1", "beacon table unreadable");
    auto r = Run("network vswitch standard list");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.err, "beacon table unreadable\n");
}

// ---------------------------------------------------------------- add

TEST_F(SwitchTest, AddCreatesASwitchWithTheHostDefaults) {
    StartJournal();
    auto r = Run("network vswitch standard add -v vSwitch2");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(Journal("HostCtl::Network::"),
              (std::vector<std::string>{"HostCtl::Network::NicCapabilities::GetDefaultPolicy",
                                        "HostCtl::Network::ShapingPolicy::GetDefaultPolicy",
                                        "HostCtl::Network::PortSecurityPolicy::GetDefaultPolicy",
                                        "HostCtl::Network::NicTeamingPolicy::GetDefaultPolicy"}));
    EXPECT_EQ(Journal("TknCtl::Network::VirtualSwitchInfoImpl::"),
              std::vector<std::string>{
                  "TknCtl::Network::VirtualSwitchInfoImpl::AddVirtualSwitchWithPolicy vSwitch2 128"});
    auto s = Switch("vSwitch2");
    EXPECT_EQ(s["numPorts"], 128);
    EXPECT_EQ(s["usedPorts"], 0);
    EXPECT_EQ(s["mtu"], 1500);
    EXPECT_EQ(s["policy"]["teaming"], json::parse(R"({"policy":3,"notifySwitches":true,
        "rollingRestoration":false,"linkCriteria":{"beacon":true}})"));
    EXPECT_EQ(s["policy"]["shaping"]["enabled"], false);
    EXPECT_EQ(s["capabilities"],
              json::parse(R"({"csumOffload":true,"tcpSegmentation":true,"zeroCopyXmit":true})"));

    EXPECT_EQ(Run("network vswitch standard add -v vSwitch3 --ports 4").status, 0);
    EXPECT_EQ(Switch("vSwitch3")["numPorts"], 4);
}

TEST_F(SwitchTest, AddKeepsTheHostsRules) {
    struct Case {
        const char* line;
        const char* message;
    };
    for (const Case& c : std::vector<Case>{
             {"-v vSwitch0",
              "Unable to create virtual switch vSwitch0: a virtual switch of that name exists"},
             {"-v dvs-prod",
              "Unable to create virtual switch dvs-prod: a distributed switch of that name exists"},
             {"-v vSwitch2 -P 3841",
              "Unable to create virtual switch vSwitch2: 3841 ports requested, but only 3840 of the host's "
              "4608 "
              "ports are left"},
             {"-v 'lab switch'",
              "Unable to create virtual switch 'lab switch': a name holds only letters, digits, '-', '_' and "
              "'.', "
              "and starts with a letter or digit"},
             {"-v -lab",
              "Unable to create virtual switch '-lab': a name holds only letters, digits, '-', '_' and "
              "'.', and starts with a letter or digit"},
             {"-v vSwitch-name-of-thirty-two-chars",
              "Unable to create virtual switch vSwitch-name-of-thirty-two-chars: the name is longer than 31 "
              "characters"},
             {"-v ''", "Unable to create virtual switch: the name is empty"},
         }) {
        auto r = Run(std::string("network vswitch standard add ") + c.line);
        EXPECT_EQ(r.status, 1) << c.line;
        EXPECT_EQ(r.Errors(), std::vector<std::string>{c.message}) << c.line;
    }
    EXPECT_EQ(Section("vswitches").size(), 2u);
    EXPECT_EQ(Run("network vswitch standard add -v vSwitch2 -P 3840").status, 0);
    // Out of range for a switch: refused before the command runs.
    EXPECT_EQ(Run("network vswitch standard add -v vSwitch3 -P 0").status, 2);
    EXPECT_EQ(Run("network vswitch standard add -v vSwitch3 -P 4097").status, 2);
}

TEST_F(SwitchTest, AddReportsAHostFailure) {
    AddFault("HostCtl::Network::ShapingPolicy::GetDefaultPolicy", "", "defaults unavailable");
    auto r = Run("network vswitch standard add -v vSwitch2");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "defaults unavailable\n");
    EXPECT_TRUE(Switch("vSwitch2").is_null());
}

// ---------------------------------------------------------------- remove

TEST_F(SwitchTest, RemoveTakesTheSwitchAndItsUplinkPorts) {
    ASSERT_EQ(Run("network vswitch standard add -v lab").status, 0);
    ASSERT_EQ(Run("network vswitch standard uplink add -v lab -u vmnic6").status, 0);
    ASSERT_EQ(Run("network vswitch standard portgroup add -v lab -p Bench").status, 0);
    ASSERT_EQ(PortsOf("lab").size(), 1u);
    auto r = Run("network vswitch standard remove -v lab");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_TRUE(Switch("lab").is_null());
    EXPECT_TRUE(PortsOf("lab").empty());
    // The NIC is free again.
    EXPECT_EQ(Run("network vswitch standard uplink add -v vSwitch1 -u vmnic6").status, 0);
}

TEST_F(SwitchTest, RemoveIsRefusedWhileTheSwitchIsInUse) {
    auto r = Run("network vswitch standard remove -v vSwitch7");
    EXPECT_EQ(r.Errors(), std::vector<std::string>{"Unable to find virtual switch with the name vSwitch7"});
    EXPECT_EQ(r.status, 1);

    r = Run("network vswitch standard remove -v vSwitch0");
    EXPECT_EQ(r.Errors(),
              std::vector<std::string>{"Unable to remove virtual switch vSwitch0: Tarkon interface "
                                       "tkn0 is connected to its port group Management Network"});

    // VM ports, then an ENS context, keep a switch without interfaces: move tkn1 to a port group
    // of vSwitch0 and a VM port onto "Migration".
    auto movePort = [](json& doc, const char* client, const char* vswitch, const char* group,
                       const char* uplink) {
        for (auto& port : doc["ports"]) {
            if (port["client"] != client) continue;
            port["switch"] = vswitch;
            port["portGroup"] = group;
            port["teamUplink"] = uplink;
        }
    };
    EditHost([&](json& doc) {
        doc["vswitches"][0]["portGroups"].push_back({{"name", "Spare"}, {"activeClients", 1}});
        doc["tknnics"][1]["connection"]["portGroup"] = "Spare";
        movePort(doc, "tkn1", "vSwitch0", "Spare", "vmnic0");
        movePort(doc, "web-01.eth0", "vSwitch1", "Migration", "vmnic2");
    });
    r = Run("network vswitch standard remove -v vSwitch1");
    EXPECT_EQ(r.Errors(), std::vector<std::string>{
                              "Unable to remove virtual switch vSwitch1: 1 virtual machine port(s) use it"});
    EditHost([&](json& doc) { movePort(doc, "web-01.eth0", "vSwitch0", "VM Network", "vmnic0"); });
    ASSERT_EQ(Run("network ens lcore add -l 1").status, 0);
    ASSERT_EQ(Run("network ens lcore switch add -l 1 -s vSwitch1").status, 0);
    r = Run("network vswitch standard remove -v vSwitch1");
    EXPECT_EQ(r.Errors(),
              std::vector<std::string>{"Unable to remove virtual switch vSwitch1: ENS context 1 serves it"});
    EXPECT_FALSE(Switch("vSwitch1").is_null());
}

TEST_F(SwitchTest, RemoveReportsAHostFailure) {
    AddFault("TknCtl::Network::VirtualSwitchInfoImpl::RemoveVirtualSwitch", "vSwitch1", "switch busy");
    auto r = Run("network vswitch standard remove -v vSwitch1");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "switch busy\n");
}

// ---------------------------------------------------------------- set

TEST_F(SwitchTest, SetChangesMtuAndCdpStatus) {
    auto r = Run("network vswitch standard set -v vSwitch0 --mtu 9000 --cdp-status both");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "");
    auto list = Json("network vswitch standard list -v vSwitch0");
    EXPECT_EQ(list[0]["MTU"], 9000);
    EXPECT_EQ(list[0]["CDP Status"], "both");
    // The uplinks carry the switch's MTU.
    auto nics = Section("pnics");
    EXPECT_EQ(nics[0]["mtu"], 9000);
    EXPECT_EQ(nics[1]["mtu"], 9000);

    for (const char* status : {"down", "listen", "advertise"}) {
        EXPECT_EQ(Run(std::string("network vswitch standard set -v vSwitch0 -c ") + status).status, 0);
        EXPECT_EQ(Json("network vswitch standard list -v vSwitch0")[0]["CDP Status"], status);
    }
}

TEST_F(SwitchTest, SetRefusesBadValuesAndUnknownSwitches) {
    const std::string before = Export();
    auto r = Run("network vswitch standard set -v vSwitch0 -m -1 -c both");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.Errors(), std::vector<std::string>{"MTU size should be a positive value"});
    EXPECT_EQ(Export(), before);  // the CDP status is not applied either

    r = Run("network vswitch standard set -v vSwitch0 -m 0");
    EXPECT_EQ(r.Errors(),
              std::vector<std::string>{
                  "Unable to set the MTU of virtual switch vSwitch0: the MTU must be between 1280 and 9000"});
    r = Run("network vswitch standard set -v vSwitch0 -m 4294968796");  // does not wrap to 1500
    EXPECT_EQ(r.Errors(),
              std::vector<std::string>{
                  "Unable to set the MTU of virtual switch vSwitch0: the MTU must be between 1280 and 9000"});
    EXPECT_EQ(Export(), before);

    r = Run("network vswitch standard set -v vSwitch7 -m 1500");
    EXPECT_EQ(r.Errors(), std::vector<std::string>{"vSwitch7 is not a valid name for a virtual switch"});

    r = Run("network vswitch standard set -v vSwitch0");  // nothing to change
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(Export(), before);
}

TEST_F(SwitchTest, SetReportsAHostFailure) {
    AddFault("HostCtl::Network::VirtualSwitch::SetCdpStatus", "vSwitch1", "CDP daemon down");
    auto r = Run("network vswitch standard set -v vSwitch1 -m 1500 -c down");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "CDP daemon down\n");
    EXPECT_EQ(Switch("vSwitch1")["mtu"], 1500);  // the step before the failure stays done
}

// ---------------------------------------------------------------- uplinks

TEST_F(SwitchTest, UplinkAddTakesAPortAndLeavesTheTeamingOrderAlone) {
    auto r = Run("network vswitch standard uplink add -v vSwitch1 -u vmnic6");
    EXPECT_EQ(r.status, 0) << r.err;
    auto s = Switch("vSwitch1");
    EXPECT_EQ(s["uplinks"], json({"vmnic2", "vmnic6"}));
    EXPECT_EQ(s["usedPorts"], 3);
    EXPECT_EQ(s["policy"]["teaming"]["uplinkOrder"], json({"vmnic2"}));
    auto ports = PortsOf("vSwitch1");
    ASSERT_EQ(ports.size(), 3u);
    EXPECT_EQ(ports[2]["type"], "uplink");
    EXPECT_EQ(ports[2]["client"], "vmnic6");
    EXPECT_EQ(ports[2]["id"], 50331653);
    EXPECT_EQ(Section("pnics")[6]["mtu"], 9000);  // the switch's MTU
    EXPECT_EQ(Json("network vswitch standard policy failover get -v vSwitch1")["Unused Adapters"],
              json({"vmnic6"}));
}

TEST_F(SwitchTest, UplinkAddKeepsTheHostsRules) {
    struct Case {
        const char* line;
        const char* message;
    };
    for (const Case& c : std::vector<Case>{
             {"-v vSwitch0 -u vmnic0",
              "Unable to add uplink vmnic0 to virtual switch vSwitch0: the switch already has it"},
             {"-v vSwitch1 -u vmnic0",
              "Unable to add uplink vmnic0 to virtual switch vSwitch1: it is an uplink of virtual switch "
              "vSwitch0"},
             {"-v vSwitch1 -u vmnic5",
              "Unable to add uplink vmnic5 to virtual switch vSwitch1: it is an uplink of distributed switch "
              "dvs-prod"},
             {"-v vSwitch1 -u vmnic9",
              "Unable to add uplink vmnic9 to virtual switch vSwitch1: the host has no physical NIC of that "
              "name"},
             {"-v vSwitch9 -u vmnic6", "Virtual switch vSwitch9 does not exist"},
         }) {
        auto r = Run(std::string("network vswitch standard uplink add ") + c.line);
        EXPECT_EQ(r.status, 1) << c.line;
        EXPECT_EQ(r.Errors(), std::vector<std::string>{c.message}) << c.line;
    }
    EditHost([](json& doc) { doc["vswitches"][1]["numPorts"] = 2; });
    auto r = Run("network vswitch standard uplink add -v vSwitch1 -u vmnic6");
    EXPECT_EQ(r.Errors(),
              std::vector<std::string>{
                  "Unable to add uplink vmnic6 to virtual switch vSwitch1: the switch has no free port"});
}

TEST_F(SwitchTest, UplinkRemoveLeavesTheTeamingOrderAndMovesTraffic) {
    auto r = Run("network vswitch standard uplink remove -v vSwitch0 -u vmnic0");
    EXPECT_EQ(r.status, 0) << r.err;
    auto s = Switch("vSwitch0");
    EXPECT_EQ(s["uplinks"], json({"vmnic1"}));
    EXPECT_EQ(s["usedPorts"], 5);
    EXPECT_EQ(s["policy"]["teaming"]["uplinkOrder"], json({"vmnic1"}));
    EXPECT_EQ(s["policy"]["teaming"]["maxActive"], 0);
    for (const auto& port : PortsOf("vSwitch0")) {
        EXPECT_NE(port["client"], "vmnic0");
        if (port["type"] != "uplink") {
            EXPECT_EQ(port["teamUplink"], "vmnic1") << port["client"];
        }
    }

    r = Run("network vswitch standard uplink remove -v vSwitch0 -u vmnic0");
    EXPECT_EQ(r.Errors(),
              std::vector<std::string>{"Unable to remove uplink vmnic0 from virtual switch vSwitch0: "
                                       "the switch has no such uplink"});
    r = Run("network vswitch standard uplink remove -v vSwitch9 -u vmnic0");
    EXPECT_EQ(r.Errors(), std::vector<std::string>{"Virtual switch vSwitch9 does not exist"});
}

TEST_F(SwitchTest, UplinkRemoveAlsoLeavesPortGroupOrders) {
    EditHost([](json& doc) {
        doc["vswitches"][0]["portGroups"][1]["policy"]["teaming"] = {{"uplinkOrder", {"vmnic1", "vmnic0"}},
                                                                     {"maxActive", 2}};
    });
    ASSERT_EQ(Run("network vswitch standard uplink remove -v vSwitch0 -u vmnic1").status, 0);
    EXPECT_EQ(Switch("vSwitch0")["portGroups"][1]["policy"]["teaming"],
              json::parse(R"({"uplinkOrder":["vmnic0"],"maxActive":1})"));
}

TEST_F(SwitchTest, UplinkCommandsReportHostFailures) {
    AddFault("HostCtl::Network::VirtualSwitch::AddUplink", "vSwitch1", "driver refused the NIC");
    auto r = Run("network vswitch standard uplink add -v vSwitch1 -u vmnic6");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "driver refused the NIC\n");
    AddFault("HostCtl::Network::NetworkFactory::GetVirtualSwitchById", "vSwitch0", "switch table locked");
    r = Run("network vswitch standard uplink remove -v vSwitch0 -u vmnic1");
    EXPECT_EQ(r.err, "switch table locked\n");
    EXPECT_EQ(Switch("vSwitch0")["uplinks"], json({"vmnic0", "vmnic1"}));
}

}  // namespace
}  // namespace Hadro::Test

// The LACP commands on fixture hosts: configuration in both forms, status texts, statistics,
// the timeout change and its refusals.
#include <list>
#include <sstream>

#include "dvs_test.h"
#include "zorbel/dispatcher.h"

namespace Hadro::Test {
namespace {

using Strings = std::vector<std::string>;

const char* const kConfig = "network vswitch dvs talvex lacp config get";
const char* const kStatus = "network vswitch dvs talvex lacp status get";
const char* const kStats = "network vswitch dvs talvex lacp stats get";
const char* const kSetTimeout = "network vswitch dvs talvex lacp timeout set ";

class LacpTest : public DvsTest {
protected:
    // dvs-prod in the switch-wide form: uplinks vmnic3 and vmnic5 (ports 0 and 1) in the uplink
    // port group dvportgroup-11, vmnic6 (port 2) in dvportgroup-12; LACP on or off per port.
    void SwitchWide(bool lacp0, bool lacp1, bool lacp2, int mode) {
        EditHost([=](nlohmann::json& doc) {
            auto& dvs = Dvs(doc);
            dvs["uplinks"] = {"vmnic3", "vmnic5", "vmnic6"};
            if (dvs["ports"].size() == 6)
                dvs["ports"].push_back({{"id", "2"}, {"portgroupId", "dvportgroup-12"}});
            dvs["ports"][0]["lacp"] = {{"enabled", lacp0}, {"mode", mode}};
            dvs["ports"][1]["lacp"] = {{"enabled", lacp1}, {"mode", mode}};
            dvs["ports"][6]["lacp"] = {{"enabled", lacp2}, {"mode", mode}};
            dvs["lacp"] = {{"form", "switchWide"},
                           {"uplinks",
                            {{{"name", "vmnic3"}, {"nic", "vmnic3"}, {"portId", "0"}},
                             {{"name", "vmnic5"}, {"nic", "vmnic5"}, {"portId", "1"}},
                             {{"name", "vmnic6"}, {"nic", "vmnic6"}, {"portId", "2"}}}}};
        });
    }
    nlohmann::json Members() { return Json(kStatus)[0]["Nic List"]; }
};

TEST_F(LacpTest, ConfigOfNamedLags) {
    EXPECT_EQ(Json(kConfig), nlohmann::json::parse(R"([{"DVS Name":"dvs-prod","LAG Name":"lag1","LAG ID":"1",
        "NICs":"vmnic3,vmnic5","Enabled":true,"Mode":"Active","Load balance":"Src and dst ip, port, vlan"}])"));

    // A passive LAG with an unassigned member slot; the first and last load-balancing names.
    EditHost([](nlohmann::json& doc) {
        auto& lacp = Dvs(doc)["lacp"];
        lacp["lags"][0].update({{"mode", 2}, {"loadBalancing", 0}, {"uplinkCount", 3}});
        lacp["uplinks"].push_back({{"name", "lag1-2"}});
        lacp["lags"].push_back({{"name", "lag2"}, {"id", 2}, {"mode", 9}, {"loadBalancing", 20}});
    });
    auto config = Json(kConfig);
    ASSERT_EQ(config.size(), 2u);
    EXPECT_EQ(config[0]["NICs"], "vmnic3,vmnic5");
    EXPECT_EQ(config[0]["Mode"], "Passive");
    EXPECT_EQ(config[0]["Load balance"], "None");
    EXPECT_EQ(config[1]["NICs"], "");
    EXPECT_EQ(config[1]["Mode"], "None");
    EXPECT_EQ(config[1]["Load balance"], "Src portID");
}

TEST_F(LacpTest, ConfigOfTheSwitchWideForm) {
    // One LAG for the uplink port group whose ports have LACP on; the other group has none on.
    SwitchWide(true, true, false, 2);
    EXPECT_EQ(Json(kConfig),
              nlohmann::json::parse(R"([{"DVS Name":"dvs-prod","LAG Name":"default_uplink_pg_lag",
        "LAG ID":"0","NICs":"vmnic3,vmnic5","Enabled":true,"Mode":"Passive","Load balance":"---"}])"));

    // A LAG per port group with LACP on; a mode code other than 1 or 2 is "None".
    SwitchWide(true, false, true, 5);
    auto config = Json(kConfig);
    ASSERT_EQ(config.size(), 2u);
    EXPECT_EQ(config[0]["NICs"], "vmnic3");
    EXPECT_EQ(config[1]["NICs"], "vmnic6");
    EXPECT_EQ(config[1]["Mode"], "None");

    // Enabled and mode come from the last port of the group.
    SwitchWide(true, false, false, 1);
    config = Json(kConfig);
    EXPECT_EQ(config[0]["Enabled"], false);
    EXPECT_EQ(config[0]["Mode"], "");

    SwitchWide(false, false, false, 1);
    auto r = Run(kConfig);
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"LACP is disabled on DVSwitch."});
}

TEST_F(LacpTest, SwitchSelection) {
    // A name the host does not know is an error, not a missing switch.
    for (std::string command : {kConfig, kStatus, kStats}) {
        auto r = Run(command + " --dvs dvs-nope");
        EXPECT_EQ(r.status, 1) << command;
        EXPECT_EQ(r.out, "") << command;
        EXPECT_EQ(r.Errors(), Strings{"Distributed switch 'dvs-nope' does not exist"}) << command;
    }
    EXPECT_EQ(Run(std::string(kSetTimeout) + "-t true -l 1 -s dvs-nope").Errors(),
              Strings{"Distributed switch 'dvs-nope' does not exist"});
    EXPECT_EQ(Json(std::string(kStats) + " -s dvs-prod").size(), 2u);

    EditHost([](nlohmann::json& doc) { doc["dvswitches"] = nlohmann::json::array(); });
    for (const char* command : {kConfig, kStatus, kStats}) {
        auto r = Run(command);
        EXPECT_EQ(r.status, 1) << command;
        EXPECT_EQ(r.out, "") << command;
        EXPECT_EQ(
            r.Errors(),
            Strings{
                "LACP is supported on Talvex DVSwitch only, and there is no DVSwitch configured on host."})
            << command;
    }
}

TEST_F(LacpTest, StatusTexts) {
    auto status = Json(kStatus);
    EXPECT_EQ(status[0]["Flags"],
              nlohmann::json({"S - Device is sending Slow LACPDUs", "F - Device is sending fast LACPDUs",
                              "A - Device is in active mode", "P - Device is in passive mode"}));
    EXPECT_EQ(status[0]["Nic List"][0], nlohmann::json::parse(R"({"Nic":"vmnic3","State":"Bundled",
        "Local Information":{"Port State":"ACT,AGG,SYN,COL,DIST,","Flags":"SA","Admin Key":3,"Oper Key":3,
                             "Port Priority":255,"Port Number":1},
        "Partner Information":{"Device ID":"02:1c:73:aa:bb:cc","Port State":"ACT,AGG,SYN,COL,DIST,","Flags":"SA",
                               "Age":"01:02:05","Oper Key":17,"Port Priority":32768,"Port Number":12}})"));

    // State bytes 0x05, 0x00 and 0xFF; ages 0 and one hundred hours; mode codes 2 and 7.
    EditHost([](nlohmann::json& doc) {
        auto& lag = Dvs(doc)["lacp"]["status"][0];
        lag["mode"] = 2;
        lag["members"][0].update({{"age", 0}});
        lag["members"][0]["actor"]["state"] = 5;
        lag["members"][0]["partner"]["state"] = 0;
        lag["members"][1].update({{"age", 360000}});
        lag["members"][1]["actor"]["state"] = 255;
    });
    status = Json(kStatus);
    EXPECT_EQ(status[0]["Mode"], "Passive");
    const auto& nics = status[0]["Nic List"];
    EXPECT_EQ(nics[0]["Local Information"]["Port State"], "ACT,AGG,");
    EXPECT_EQ(nics[0]["Partner Information"]["Port State"], "");
    EXPECT_EQ(nics[0]["Partner Information"]["Age"], "00:00:00");
    EXPECT_EQ(nics[1]["Local Information"]["Port State"], "ACT,FTO,AGG,SYN,COL,DIST,DEF,EXP,");
    EXPECT_EQ(nics[1]["Partner Information"]["Age"], "100:00:00");
    EditHost([](nlohmann::json& doc) { Dvs(doc)["lacp"]["status"][0]["mode"] = 7; });
    EXPECT_EQ(Json(kStatus)[0]["Mode"], "Active");

    // Simple form: a heading per LAG, the member records without headings.
    auto r = Run(kStatus);
    EXPECT_EQ(r.out.rfind("dvs-prod\n   DVSwitch: dvs-prod\n   LAG ID: 1\n", 0), 0u) << r.out;
    EXPECT_NE(r.out.find("   Nic List:\n      Nic: vmnic3\n"), std::string::npos) << r.out;
}

TEST_F(LacpTest, StatisticsAndLagsWithoutMembers) {
    auto r = Run(kStats);
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out,
              "DVSwitch  NIC     LAG ID  Tx LACPDUs  Tx Errors  Rx LACPDUs  Rx Errors\n"
              "--------  ------  ------  ----------  ---------  ----------  ---------\n"
              "dvs-prod  vmnic3  1       125441      0          125432      0\n"
              "dvs-prod  vmnic5  1       125442      0          125433      1\n");

    EditHost([](nlohmann::json& doc) { Dvs(doc)["lacp"]["status"][0]["members"] = nlohmann::json::array(); });
    r = Run(kStats);
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"No pnic is connected to DVSwitch."});
    EXPECT_EQ(Members(), nlohmann::json::array());

    EditHost([](nlohmann::json& doc) { Dvs(doc)["lacp"]["status"] = nlohmann::json::array(); });
    for (const char* command : {kStatus, kStats}) {
        r = Run(command);
        EXPECT_EQ(r.status, 1);
        EXPECT_EQ(r.out, "");
        EXPECT_EQ(r.Errors(), Strings{"No running LACP group on the host."}) << command;
    }
}

TEST_F(LacpTest, TimeoutChangesTheMembersFlags) {
    StartJournal();
    auto r = Run(std::string(kSetTimeout) + "--timeout true --lag-id 1 --qbr dvs-prod");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(Journal("HostCtl::Network::"),
              (Strings{"HostCtl::Network::NetworkFactory::GetDVSwitchByName dvs-prod",
                       "HostCtl::Network::DVSwitch::SetLacpTimeout dvs-prod 1 true"}));
    for (const auto& nic : Members()) {
        EXPECT_EQ(nic["Local Information"]["Port State"], "ACT,FTO,AGG,SYN,COL,DIST,");
        EXPECT_EQ(nic["Local Information"]["Flags"], "FA");
        EXPECT_EQ(nic["Partner Information"]["Flags"], "SA");
    }

    // One member back to the long timeout.
    EXPECT_EQ(Run(std::string(kSetTimeout) + "-t false -n vmnic5 -l 1 -s dvs-prod").status, 0);
    auto members = Members();
    EXPECT_EQ(members[0]["Local Information"]["Flags"], "FA");
    EXPECT_EQ(members[1]["Local Information"]["Flags"], "SA");
    EXPECT_EQ(members[1]["Local Information"]["Port State"], "ACT,AGG,SYN,COL,DIST,");
}

TEST_F(LacpTest, TimeoutRefusesWhatTheSwitchDoesNotHave) {
    const auto before = Section("dvswitches");
    const std::string set = std::string(kSetTimeout) + "-t true -s dvs-prod ";
    EXPECT_EQ(Run(set + "-l 7").Errors(), Strings{"Distributed switch dvs-prod has no LAG with ID 7"});
    // Never another LAG by a wrapped number.
    EXPECT_EQ(Run(set + "-l 4294967297").Errors(),
              Strings{"Distributed switch dvs-prod has no LAG with ID 4294967297"});
    auto r = Run(set + "-l 1 -n vmnic0");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"NIC vmnic0 is not a member of LAG 1 on distributed switch dvs-prod"});
    EXPECT_EQ(Section("dvswitches"), before);
}

TEST_F(LacpTest, TimeoutChecksItsOwnInput) {
    // The command run directly, without the parser that refuses missing options first.
    auto dispatcher = Zorbel::AutoCli::Dispatcher::New("hadrocli");
    std::ostringstream loading;
    dispatcher->LoadPluginDirectories({HADRO_PLUGIN_DIR}, loading);
    std::list<std::string> path{"network", "vswitch", "dvs", "talvex", "lacp", "timeout", "set"};
    auto command =
        std::dynamic_pointer_cast<Zorbel::AutoCli::Command>(dispatcher->GetRoot()->ResolveNode(path));
    ASSERT_TRUE(command) << loading.str();
    auto input = Zorbel::CallSpec::Input::New();
    auto errors = [&] {
        auto output = Zorbel::CallSpec::Output::New();
        command->Execute(input, output);
        EXPECT_EQ(output->GetRootObject(), nullptr);
        return output->GetErrorMessages();
    };
    EXPECT_EQ(errors(), Strings{"Timeout is empty"});
    input->SetBool("timeout", "true", true);
    EXPECT_EQ(errors(), Strings{"QBR name is empty"});
    input->SetString("qbr", "dvs-prod");
    EXPECT_EQ(errors(), Strings{"LAG ID is empty"});
}

TEST_F(LacpTest, HostFailuresAndInconsistentState) {
    AddFault("HostCtl::Network::DVSwitch::GetLacpConfig", "dvs-prod", "LACP daemon is restarting", 1);
    AddFault("HostCtl::Network::DVSwitch::GetLacpStatus", "dvs-prod", "LACP status unavailable", 2);
    AddFault("HostCtl::Network::DVSwitch::SetLacpTimeout", "dvs-prod", "LAG is being reconfigured", 1);
    EXPECT_EQ(Run(kConfig).Errors(), Strings{"LACP daemon is restarting"});
    EXPECT_EQ(Run(kStatus).Errors(), Strings{"LACP status unavailable"});
    EXPECT_EQ(Run(kStats).Errors(), Strings{"LACP status unavailable"});
    auto r = Run(std::string(kSetTimeout) + "-t 1 -l 1 -s dvs-prod");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.Errors(), Strings{"LAG is being reconfigured"});

    // A LAG member that is not an uplink of its switch: the host's state is refused.
    EditHost([](nlohmann::json& doc) { Dvs(doc)["lacp"]["uplinks"][1]["nic"] = "vmnic1"; });
    r = Run(kConfig);
    EXPECT_EQ(r.status, 3);
    EXPECT_NE(r.err.find("LACP uplink 'lag1-1' uses NIC 'vmnic1', which is not an uplink of the switch"),
              std::string::npos)
        << r.err;
}

}  // namespace
}  // namespace Hadro::Test

// "network vswitch dvs talvex list" on fixture hosts.
#include "dvs_test.h"

namespace Hadro::Test {
namespace {

class DvsListTest : public DvsTest {
protected:
    // A second, smaller distributed switch after dvs-prod.
    void AddLabSwitch() {
        EditHost([](nlohmann::json& doc) {
            doc["dvswitches"].push_back({{"name", "dvs-lab"},
                                         {"uuid", "50 aa"},
                                         {"numPorts", 64},
                                         {"cdpStatus", "both"},
                                         {"beaconTimeout", 5},
                                         {"branded", false},
                                         {"uplinks", {"vmnic6"}},
                                         {"ports", {{{"id", "7"}, {"portgroupId", "dvportgroup-70"}}}}});
        });
    }
};

TEST_F(DvsListTest, ListsEverySwitchWithItsPorts) {
    auto list = Json("network vswitch dvs talvex list");
    ASSERT_EQ(list.size(), 1u);
    const auto& dvs = list[0];
    EXPECT_EQ(dvs["Name"], "dvs-prod");
    EXPECT_EQ(dvs["QBR ID"], "50 1e 3b 0c 7a 9d 41 2f-8e 6d 1a 2b 3c 4d 5e 6f");
    EXPECT_EQ(dvs["Class"], "cswitch");
    EXPECT_EQ(dvs["Num Ports"], 512);
    EXPECT_EQ(dvs["Used Ports"], 5);
    EXPECT_EQ(dvs["Configured Ports"], 512);
    EXPECT_EQ(dvs["MTU"], 9000);
    EXPECT_EQ(dvs["CDP Status"], "listen");
    EXPECT_EQ(dvs["Beacon Timeout"], -1);
    EXPECT_EQ(dvs["Uplinks"], nlohmann::json({"vmnic3", "vmnic5"}));
    EXPECT_EQ(dvs["Talvex Branded"], true);
    ASSERT_EQ(dvs["DVPort"].size(), 6u);
    EXPECT_EQ(dvs["DVPort"][2], nlohmann::json::parse(R"({"Port ID":"10","In Use":true,
              "DVPortgroup ID":"dvportgroup-21","Client":["db-01.eth0"]})"));
    // A port without clients.
    EXPECT_EQ(dvs["DVPort"][4], nlohmann::json::parse(R"({"Port ID":"12","In Use":false,
              "DVPortgroup ID":"dvportgroup-21","Client":[]})"));

    // The simple form: a heading per switch, each port's fields nested under "DVPort".
    auto r = Run("network vswitch dvs talvex list");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out.rfind("dvs-prod\n   Name: dvs-prod\n", 0), 0u) << r.out;
    EXPECT_NE(
        r.out.find("   DVPort:\n      Port ID: 0\n      In Use: true\n      DVPortgroup ID: dvportgroup-11\n"
                   "      Client: vmnic3\n\n      Port ID: 1\n"),
        std::string::npos)
        << r.out;
}

TEST_F(DvsListTest, SelectsOneSwitchByName) {
    AddLabSwitch();
    auto all = Json("network vswitch dvs talvex list");
    ASSERT_EQ(all.size(), 2u);
    EXPECT_EQ(all[1]["Name"], "dvs-lab");

    auto lab = Json("network vswitch dvs talvex list --qbr-name dvs-lab");
    ASSERT_EQ(lab.size(), 1u);
    EXPECT_EQ(lab[0]["CDP Status"], "both");
    EXPECT_EQ(lab[0]["Beacon Timeout"], 5);
    EXPECT_EQ(lab[0]["Talvex Branded"], false);
    EXPECT_EQ(lab[0]["Uplinks"], nlohmann::json({"vmnic6"}));
    EXPECT_EQ(lab[0]["DVPort"][0]["In Use"], false);
}

TEST_F(DvsListTest, UnknownNameKeepsAnEmptyListAndSaysSo) {
    auto r = Run("--formatter=json network vswitch dvs talvex list -v dvs-nope");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "[]\n");
    EXPECT_EQ(r.Errors(), std::vector<std::string>{"Unable to access all qBR"});
}

TEST_F(DvsListTest, HostWithoutDistributedSwitches) {
    EditHost([](nlohmann::json& doc) { doc["dvswitches"] = nlohmann::json::array(); });
    auto r = Run("--formatter=json network vswitch dvs talvex list");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, "[]\n");
    EXPECT_EQ(r.err, "");
}

TEST_F(DvsListTest, HostFailureIsReportedByItsMessage) {
    AddFault("HostCtl::Network::DVSwitch::GetUuid", "dvs-prod", "switch state is being rebuilt", 1);
    auto r = Run("network vswitch dvs talvex list");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), std::vector<std::string>{"switch state is being rebuilt"});

    // The ports are read through the distributed ports themselves.
    AddFault("TknCtl::Network::DVPortImpl::GetInUse", "12", "port 12 is locked");
    r = Run("network vswitch dvs talvex list");
    EXPECT_EQ(r.Errors(), std::vector<std::string>{"port 12 is locked"});
}

}  // namespace
}  // namespace Hadro::Test

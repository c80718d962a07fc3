// "network vswitch dvs talvex list" on fixture hosts.
#include "dvs_test.h"

namespace Hadro::Test {
namespace {

using DvsListTest = DvsTest;

TEST_F(DvsListTest, ListsSwitchesWithTheirPorts) {
    auto dvs = Json("network vswitch dvs talvex list")[0];
    EXPECT_EQ(dvs["QBR ID"], "50 1e 3b 0c 7a 9d 41 2f-8e 6d 1a 2b 3c 4d 5e 6f");
    EXPECT_EQ(dvs["Used Ports"], 5);
    EXPECT_EQ(dvs["CDP Status"], "listen");
    EXPECT_EQ(dvs["Beacon Timeout"], -1);
    EXPECT_EQ(dvs["Uplinks"], nlohmann::json({"vmnic3", "vmnic5"}));
    ASSERT_EQ(dvs["DVPort"].size(), 6u);
    EXPECT_EQ(dvs["DVPort"][4], nlohmann::json::parse(R"({"Port ID":"12","In Use":false,
              "DVPortgroup ID":"dvportgroup-21","Client":[]})"));
    // Simple form: a heading per switch, each port's own fields under "DVPort".
    auto r = Run("network vswitch dvs talvex list");
    EXPECT_EQ(r.out.rfind("dvs-prod\n   Name: dvs-prod\n", 0), 0u) << r.out;
    EXPECT_NE(r.out.find("   DVPort:\n      Port ID: 0\n      In Use: true\n"), std::string::npos) << r.out;

    // One switch by name.
    EditHost([](nlohmann::json& doc) {
        doc["dvswitches"].push_back({{"name", "dvs-lab"},
                                     {"uuid", "50 aa"},
                                     {"cdpStatus", "both"},
                                     {"branded", false},
                                     {"uplinks", {"vmnic6"}}});
    });
    EXPECT_EQ(Json("network vswitch dvs talvex list").size(), 2u);
    auto lab = Json("network vswitch dvs talvex list --qbr-name dvs-lab");
    ASSERT_EQ(lab.size(), 1u);
    EXPECT_EQ(lab[0]["Talvex Branded"], false);
    EXPECT_EQ(lab[0]["DVPort"], nlohmann::json::array());
}

TEST_F(DvsListTest, UnknownNameAndHostWithoutSwitches) {
    auto r = Run("--formatter=json network vswitch dvs talvex list -v dvs-nope");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "[]\n");
    EXPECT_EQ(r.Errors(), std::vector<std::string>{"Unable to access all qBR"});

    EditHost([](nlohmann::json& doc) { doc["dvswitches"] = nlohmann::json::array(); });
    r = Run("--formatter=json network vswitch dvs talvex list");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, "[]\n");
    EXPECT_EQ(r.err, "");
}

TEST_F(DvsListTest, HostFailure) {
    AddFault("TknCtl::Network::DVPortImpl::GetInUse", "12", "port 12 is locked");
    auto r = Run("network vswitch dvs talvex list");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), std::vector<std::string>{"port 12 is locked"});
}

}  // namespace
}  // namespace Hadro::Test

// "network sriovnic" list, VF list and VF statistics on fixture hosts.
#include <nlohmann/json.hpp>

#include "harness.h"

namespace {

using nlohmann::json;

class SriovTest : public Hadro::Test::CommandTest {
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
};

TEST_F(SriovTest, ListShowsTheEnabledPhysicalFunctions) {
    auto list = Json("network sriovnic list");
    ASSERT_EQ(list.size(), 2u);
    EXPECT_EQ(list[0],
              json::parse(R"({"Name":"vmnic5","PCI Device":"0000:3b:00.0","Driver":"mfx5","Link":"Up",
        "Speed":25000,"Duplex":"Full","MAC Address":"0a:8e:41:40:00:00","MTU":9000,
        "Description":"Meridian Fabric MF-25 25GbE SmartNIC"})"));
    EXPECT_EQ(list[1]["Name"], "vmnic6");

    // A pseudo adapter is not described by its USB text here.
    EditHost([](json& doc) {
        doc["pnics"][4]["sriov"]["enabled"] = true;
        doc["pnics"][5]["sriov"]["enabled"] = false;
        doc["pnics"][5]["sriov"]["vfs"] = json::array();
        doc["pnics"][6]["sriov"]["enabled"] = false;
    });
    list = Json("network sriovnic list");
    ASSERT_EQ(list.size(), 1u);
    EXPECT_EQ(list[0]["PCI Device"], "Pseudo");
    EXPECT_EQ(list[0]["Description"], "Unknown Unknown");

    EditHost([](json& doc) { doc["pnics"][4]["sriov"]["enabled"] = false; });
    EXPECT_EQ(Json("network sriovnic list"), json::array());
    EXPECT_EQ(Run("network sriovnic list").out, "");
}

TEST_F(SriovTest, VfList) {
    EXPECT_EQ(Json("network sriovnic vf list -n vmnic5"), json::parse(R"([
        {"VF ID":0,"Active":true,"PCI Address":"0000:3b:00.2","Owner World ID":"2110598"},
        {"VF ID":1,"Active":false,"PCI Address":"0000:3b:00.3","Owner World ID":""},
        {"VF ID":2,"Active":false,"PCI Address":"0000:3b:00.4","Owner World ID":""},
        {"VF ID":3,"Active":false,"PCI Address":"0000:3b:00.5","Owner World ID":""}])"));
    EXPECT_EQ(Json("network sriovnic vf list -n vmnic6"), json::array());
    EXPECT_EQ(Error("network sriovnic vf list -n vmnic0"), "There is no SRIOV Nic with name vmnic0");
    EXPECT_EQ(Error("network sriovnic vf list -n vmnic9"), "There is no SRIOV Nic with name vmnic9");
    AddFault("TknCtl::Network::NetworkInfoImpl::GetSriovNicVFInfo", "vmnic5", "PF reset in progress");
    EXPECT_EQ(Error("network sriovnic vf list -n vmnic5"),
              "Unable to get VF Info. Error:PF reset in progress");
}

TEST_F(SriovTest, VfStats) {
    auto list = Json("network sriovnic vf stats -n vmnic5 -v 0");
    ASSERT_EQ(list.size(), 1u);
    EXPECT_EQ(list[0]["NIC Name"], "vmnic5");
    EXPECT_EQ(list[0]["VF ID"], 0);
    EXPECT_EQ(list[0]["Rx Unicast Pkt"], 9211873);
    EXPECT_EQ(list[0]["Tx TSO Bytes"], 913220118);
    EXPECT_EQ(list[0].size(), 22u);
    EXPECT_EQ(Json("network sriovnic vf stats -n vmnic5 --vf-id +3")[0]["VF ID"], 3);
    // Counters of 2^63 and more are shown as they are.
    EditHost([](json& doc) {
        for (auto& nic : doc["pnics"]) {
            if (nic["name"] == "vmnic5")
                nic["sriov"]["vfs"][0]["stats"]["txTsoBytes"] = 9223372036854775809ull;
        }
    });
    EXPECT_EQ(Json("network sriovnic vf stats -n vmnic5 -v 0")[0]["Tx TSO Bytes"], 9223372036854775809ull);
    EXPECT_NE(
        Run("network sriovnic vf stats -n vmnic5 -v 0").out.find("\nTx TSO Bytes: 9223372036854775809\n"),
        std::string::npos);

    EXPECT_EQ(Error("network sriovnic vf stats -n vmnic5 -v 4"),
              "Unable to get VF Stats. Error:vmnic5 has no VF 4");
    // IDs are 8-bit: 256 is not VF 0.
    EXPECT_EQ(Error("network sriovnic vf stats -n vmnic5 -v 256"),
              "Unable to get VF Stats. Error:VF ID 256 is out of range (0 to 255)");
    EXPECT_EQ(Error("network sriovnic vf stats -n vmnic5 -v -1"),
              "Unable to get VF Stats. Error:VF ID -1 is out of range (0 to 255)");
    EXPECT_EQ(Error("network sriovnic vf stats -n vmnic6 -v 0"),
              "Unable to get VF Stats. Error:vmnic6 has no VF 0");
    EXPECT_EQ(Error("network sriovnic vf stats -n vmnic1 -v 0"), "There is no SRIOV Nic with name vmnic1");
    AddFault("TknCtl::Network::NetworkInfoImpl::GetSriovNicByName", "", "SR-IOV service down");
    EXPECT_EQ(Error("network sriovnic vf stats -n vmnic5 -v 0"),
              "Unable to get VF Stats. Error:SR-IOV service down");
}

TEST_F(SriovTest, ListFailures) {
    AddFault("HostCtl::Network::Pnic::GetLinkSpeed", "vmnic6", "link query failed");
    EXPECT_EQ(Error("network sriovnic list"), "Unable to list NICs.  Error was link query failed");
    AddFault("TknCtl::Network::NetworkInfoImpl::GetSriovNics", "", "no PFs");
    EXPECT_EQ(Error("network sriovnic list"), "Unable to list NICs.  Error was no PFs");
}

}  // namespace

// Failover, security and shaping policies of switches and port groups.
#include "vswitch_test.h"

namespace Hadro::Test {
namespace {

using nlohmann::json;
using Lines = std::vector<std::string>;

class PolicyTest : public VswitchTest {
protected:
    json Failover(const std::string& vswitch = "vSwitch0") {
        return Json("network vswitch standard policy failover get -v " + vswitch);
    }
    // Active, standby and unused adapters of a failover record.
    static json Adapters(const json& record) {
        return {record["Active Adapters"], record["Standby Adapters"], record["Unused Adapters"]};
    }
};

// ---------------------------------------------------------------- failover: the order arithmetic

TEST_F(PolicyTest, ActiveListAloneKeepsTheOldStandbyList) {
    ThreeUplinks(1);
    auto r = Run("network vswitch standard policy failover set -v vSwitch0 --active-uplinks vmnic1");
    EXPECT_EQ(r.status, 0) << r.err;
    // vmnic1 leaves the standby list, vmnic4 stays standby, vmnic0 is unused.
    EXPECT_EQ(Adapters(Failover()), json::parse(R"([["vmnic1"],["vmnic4"],["vmnic0"]])"));
}

TEST_F(PolicyTest, StandbyListAloneKeepsTheOldActiveList) {
    ThreeUplinks(2);
    ASSERT_EQ(Run("network vswitch standard policy failover set -v vSwitch0 -s vmnic1").status, 0);
    // The given list replaces the whole standby list.
    EXPECT_EQ(Adapters(Failover()), json::parse(R"([["vmnic0"],["vmnic1"],["vmnic4"]])"));
    EXPECT_EQ(Switch("vSwitch0")["policy"]["teaming"]["maxActive"], 1);
}

TEST_F(PolicyTest, BothListsReplaceTheOrder) {
    ThreeUplinks(1);
    ASSERT_EQ(
        Run("network vswitch standard policy failover set -v vSwitch0 -a vmnic4,vmnic0 -s vmnic1").status, 0);
    EXPECT_EQ(Adapters(Failover()), json::parse(R"([["vmnic4","vmnic0"],["vmnic1"],[]])"));
}

TEST_F(PolicyTest, UplinkListErrorsAccumulateAndNothingIsWritten) {
    ThreeUplinks(1);
    const json before = Switch("vSwitch0");
    StartJournal();
    auto r =
        Run("network vswitch standard policy failover set -v vSwitch0 -l iphash -a vmnic9,vmnic6,vmnic0 -s "
            "vmnicX,vmnic1");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");  // a true root prints nothing
    EXPECT_EQ(r.Errors(), (Lines{"Unknown NIC name in active uplinks : vmnic9",
                                 "NIC is not connected to the vswitch : vmnic6",
                                 "Unknown NIC name in standby uplinks : vmnicX"}));
    EXPECT_TRUE(Journal("HostCtl::Network::VirtualSwitch::UpdateTeamingPolicy").empty());
    EXPECT_EQ(Switch("vSwitch0"), before);

    r = Run("network vswitch standard policy failover set -v vSwitch0 -a vmnic0 -s vmnic1,vmnic0");
    EXPECT_EQ(r.Errors(), Lines{"some NICs appear in the input for more than once."});
    r = Run("network vswitch standard policy failover set -v vSwitch0 -a vmnic1,vmnic1");
    EXPECT_EQ(r.Errors(), Lines{"some NICs appear in the input for more than once."});
    EXPECT_EQ(Switch("vSwitch0"), before);
}

TEST_F(PolicyTest, OnANewSwitchEveryUplinkIsActiveUntilAnOrderIsSet) {
    ASSERT_EQ(Run("network vswitch standard add -v lab").status, 0);
    ASSERT_EQ(Run("network vswitch standard uplink add -v lab -u vmnic6").status, 0);
    ASSERT_EQ(Run("network vswitch standard uplink add -v lab -u vmnic4").status, 0);
    EXPECT_EQ(Adapters(Failover("lab")), json::parse(R"([["vmnic6","vmnic4"],[],[]])"));
    ASSERT_EQ(Run("network vswitch standard policy failover set -v lab -s vmnic4").status, 0);
    EXPECT_EQ(Adapters(Failover("lab")), json::parse(R"([["vmnic6"],["vmnic4"],[]])"));
}

// ---------------------------------------------------------------- failover: the other fields

TEST_F(PolicyTest, FailoverFieldsReadBackAsSet) {
    EXPECT_EQ(Failover(), json::parse(R"({"Load Balancing":"srcport","Network Failure Detection":"link",
        "Notify Switches":true,"Failback":true,"Active Adapters":["vmnic0"],"Standby Adapters":["vmnic1"],
        "Unused Adapters":[]})"));
    for (auto [given, shown] : std::vector<std::pair<std::string, std::string>>{
             {"iphash", "iphash"}, {"mac", "srcmac"}, {"explicit", "explicit"}, {"portid", "srcport"}}) {
        ASSERT_EQ(Run("network vswitch standard policy failover set -v vSwitch0 -l " + given).status, 0);
        EXPECT_EQ(Failover()["Load Balancing"], shown);
    }
    ASSERT_EQ(
        Run("network vswitch standard policy failover set -v vSwitch0 -f beacon -n false -b false").status,
        0);
    auto record = Failover();
    EXPECT_EQ(record["Network Failure Detection"], "beacon");
    EXPECT_EQ(record["Notify Switches"], false);
    EXPECT_EQ(record["Failback"], false);
    ASSERT_EQ(Run("network vswitch standard policy failover set -v vSwitch0 -f link").status, 0);
    EXPECT_EQ(Failover()["Network Failure Detection"], "link");

    EditHost([](json& doc) { doc["vswitches"][0]["policy"]["teaming"]["policy"] = 9; });
    EXPECT_EQ(Failover()["Load Balancing"], "unknown");
    EXPECT_EQ(Run("network vswitch standard policy failover set -v vSwitch0 -l mac").status, 0);
}

TEST_F(PolicyTest, SwitchPolicyCommandsNameAnUnknownSwitch) {
    for (const char* command :
         {"failover get", "failover set", "security get", "security set", "shaping get", "shaping set"}) {
        auto r = Run(std::string("network vswitch standard policy ") + command + " -v vSwitch7");
        EXPECT_EQ(r.status, 1) << command;
        EXPECT_EQ(r.out, "") << command;
        EXPECT_EQ(r.Errors(), Lines{"Unable to find a legacy virtual switch with the name vSwitch7"})
            << command;
    }
}

TEST_F(PolicyTest, PolicyCommandsReportHostFailures) {
    struct Case {
        const char* operation;
        const char* target;
        const char* line;
    };
    for (const Case& c : std::vector<Case>{
             {"HostCtl::Network::VirtualSwitch::UpdateTeamingPolicy", "vSwitch0",
              "vswitch standard policy failover set -v vSwitch0 -n false"},
             {"HostCtl::Network::VirtualSwitch::GetTeamingPolicy", "vSwitch0",
              "vswitch standard policy failover get -v vSwitch0"},
             {"HostCtl::Network::VirtualSwitch::UpdateSecurityPolicy", "vSwitch0",
              "vswitch standard policy security set -v vSwitch0 -p true"},
             {"HostCtl::Network::VirtualSwitch::GetSecurityPolicy", "vSwitch0",
              "vswitch standard policy security get -v vSwitch0"},
             {"HostCtl::Network::VirtualSwitch::UpdateShapingPolicy", "vSwitch0",
              "vswitch standard policy shaping set -v vSwitch0 -e false"},
             {"HostCtl::Network::VirtualSwitch::GetShapingPolicy", "vSwitch0",
              "vswitch standard policy shaping get -v vSwitch0"},
             {"HostCtl::Network::PortGroup::UpdateTeamingPolicy", "Migration",
              "vswitch standard portgroup policy failover set -p Migration -u"},
             {"HostCtl::Network::PortGroup::GetOwnTeamingPolicy", "Migration",
              "vswitch standard portgroup policy failover get -p Migration"},
             {"HostCtl::Network::PortGroup::UpdateSecurityPolicy", "Migration",
              "vswitch standard portgroup policy security set -p Migration -o true"},
             {"HostCtl::Network::PortGroup::GetSecurityPolicy", "Migration",
              "vswitch standard portgroup policy security get -p Migration"},
             {"HostCtl::Network::PortGroup::UpdateShapingPolicy", "Migration",
              "vswitch standard portgroup policy shaping set -p Migration -u"},
             {"HostCtl::Network::PortGroup::GetOwnShapingPolicy", "Migration",
              "vswitch standard portgroup policy shaping get -p Migration"},
         }) {
        AddFault(c.operation, c.target, "policy store unavailable", 1);
        auto r = Run(std::string("network ") + c.line);
        EXPECT_EQ(r.status, 1) << c.line;
        EXPECT_EQ(r.out, "") << c.line;
        EXPECT_EQ(r.err, "policy store unavailable\n") << c.line;
    }
}

// ---------------------------------------------------------------- port-group failover

TEST_F(PolicyTest, PortGroupFailoverShowsOverridesAndFollowsTheSwitch) {
    auto migration = Json("network vswitch standard portgroup policy failover get -p Migration");
    EXPECT_EQ(migration, json::parse(R"({"Load Balancing":"explicit","Network Failure Detection":"link",
        "Notify Switches":false,"Failback":true,"Active Adapters":["vmnic2"],"Standby Adapters":[],
        "Unused Adapters":[],"Override Vswitch Load Balancing":true,
        "Override Vswitch Network Failure Detection":false,"Override Vswitch Notify Switches":true,
        "Override Vswitch Failback":false,"Override Vswitch Uplinks":false})"));

    // Not overridden: the switch's change shows through; overridden: it does not.
    ASSERT_EQ(Run("network vswitch standard policy failover set -v vSwitch1 -b false -n true").status, 0);
    migration = Json("network vswitch standard portgroup policy failover get -p Migration");
    EXPECT_EQ(migration["Failback"], false);
    EXPECT_EQ(migration["Notify Switches"], false);

    ASSERT_EQ(Run("network vswitch standard portgroup policy failover set -p 'VM Network' -s vmnic0").status,
              0);
    auto vm = Json("network vswitch standard portgroup policy failover get -p 'VM Network'");
    EXPECT_EQ(Adapters(vm), json::parse(R"([[],["vmnic0"],["vmnic1"]])"));
    EXPECT_EQ(vm["Override Vswitch Uplinks"], true);
    EXPECT_EQ(Adapters(Failover()), json::parse(R"([["vmnic0"],["vmnic1"],[]])"));  // the switch is untouched

    auto r = Run("network vswitch standard portgroup policy failover set -p 'VM Network' -a vmnic2");
    EXPECT_EQ(r.Errors(), Lines{"NIC is not connected to the vswitch : vmnic2"});
}

TEST_F(PolicyTest, UseVswitchDropsEveryOverrideBeforeTheOtherOptions) {
    ASSERT_EQ(Run("network vswitch standard portgroup policy failover set -p Migration -u").status, 0);
    auto migration = Json("network vswitch standard portgroup policy failover get -p Migration");
    EXPECT_EQ(migration["Load Balancing"], "srcport");
    for (const char* field :
         {"Override Vswitch Load Balancing", "Override Vswitch Network Failure Detection",
          "Override Vswitch Notify Switches", "Override Vswitch Failback", "Override Vswitch Uplinks"}) {
        EXPECT_EQ(migration[field], false) << field;
    }
    ASSERT_EQ(Run("network vswitch standard portgroup policy failover set -p Migration -u -f beacon").status,
              0);
    migration = Json("network vswitch standard portgroup policy failover get -p Migration");
    EXPECT_EQ(migration["Network Failure Detection"], "beacon");
    EXPECT_EQ(migration["Override Vswitch Network Failure Detection"], true);
    EXPECT_EQ(migration["Override Vswitch Load Balancing"], false);
}

TEST_F(PolicyTest, PortGroupPolicyCommandsNameAnUnknownPortGroup) {
    for (const char* command :
         {"failover get", "failover set", "security get", "security set", "shaping get", "shaping set"}) {
        auto r = Run(std::string("network vswitch standard portgroup policy ") + command + " -p Storage");
        EXPECT_EQ(r.status, 1) << command;
        EXPECT_EQ(r.Errors(), Lines{"Unable to find a port group with the name Storage"}) << command;
    }
}

// ---------------------------------------------------------------- security

TEST_F(PolicyTest, SecurityOfSwitchesAndPortGroups) {
    ASSERT_EQ(Run("network vswitch standard policy security set -v vSwitch0 -p true -m true").status, 0);
    EXPECT_EQ(Json("network vswitch standard policy security get -v vSwitch0"),
              json::parse(R"({"Allow Promiscuous":true,"Allow MAC Address Change":true,
                  "Allow Forged Transmits":false})"));
    EXPECT_EQ(Json("network vswitch standard portgroup policy security get -p 'VM Network'"),
              json::parse(
                  R"({"Allow Promiscuous":true,"Allow MAC Address Change":true,"Allow Forged Transmits":true,
                  "Override Vswitch Allow Promiscuous":false,"Override Vswitch Allow MAC Address Change":false,
                  "Override Vswitch Allow Forged Transmits":true})"));

    ASSERT_EQ(Run("network vswitch standard portgroup policy security set -p 'VM Network' -o false").status,
              0);
    auto vm = Json("network vswitch standard portgroup policy security get -p 'VM Network'");
    EXPECT_EQ(vm["Allow Promiscuous"], false);
    EXPECT_EQ(vm["Override Vswitch Allow Promiscuous"], true);
    EXPECT_EQ(vm["Override Vswitch Allow Forged Transmits"], true);

    ASSERT_EQ(
        Run("network vswitch standard portgroup policy security set -p 'VM Network' -u -m false").status, 0);
    vm = Json("network vswitch standard portgroup policy security get -p 'VM Network'");
    EXPECT_EQ(vm["Allow Promiscuous"], true);
    EXPECT_EQ(vm["Allow Forged Transmits"], false);
    EXPECT_EQ(vm["Override Vswitch Allow MAC Address Change"], true);
    EXPECT_EQ(vm["Override Vswitch Allow Forged Transmits"], false);
}

// ---------------------------------------------------------------- shaping

TEST_F(PolicyTest, ShapingValuesAreConvertedBothWays) {
    EXPECT_EQ(Run("network vswitch standard policy shaping get -v vSwitch0").out,
              "Enabled: false\nAverage Bandwidth: -1 Kbps\nPeak Bandwidth: -1 Kbps\nBurst Size: -1 Kib\n");
    auto r = Run("network vswitch standard policy shaping set -v vSwitch0 -e true -b 1500 -k 3001 -t 77");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(Switch("vSwitch0")["policy"]["shaping"],
              json::parse(R"({"enabled":true,"averageBps":1500000,"peakBps":3001000,"burstSize":9856})"));
    EXPECT_EQ(Run("network vswitch standard policy shaping get -v vSwitch0").out,
              "Enabled: true\nAverage Bandwidth: 1500 Kbps\nPeak Bandwidth: 3001 Kbps\nBurst Size: 77 Kib\n");

    // Already enabled: one value alone changes.
    ASSERT_EQ(Run("network vswitch standard policy shaping set -v vSwitch0 --avg-bandwidth 2000").status, 0);
    EXPECT_EQ(Json("network vswitch standard policy shaping get -v vSwitch0")["Average Bandwidth"], 2000);
    EXPECT_EQ(Json("network vswitch standard policy shaping get -v vSwitch0")["Peak Bandwidth"], 3001);
}

TEST_F(PolicyTest, ShapingRefusesMissingAndOversizedValues) {
    const json before = Switch("vSwitch0");
    auto r =
        Run("network vswitch standard policy shaping set -v vSwitch0 --enabled true --avg-bandwidth 1000");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.Errors(), (Lines{"Missing required parameter --peak-bandwidth",
                                 "Missing required parameter --burst-size"}));
    r = Run("network vswitch standard policy shaping set -v vSwitch0 -e true");
    EXPECT_EQ(r.Errors(), (Lines{"Missing required parameter --avg-bandwidth",
                                 "Missing required parameter --peak-bandwidth",
                                 "Missing required parameter --burst-size"}));
    r =
        Run("network vswitch standard policy shaping set -v vSwitch0 -e true -b 9223372036854775807 -k 1 -t "
            "9223372036854775807");
    EXPECT_EQ(r.Errors(), (Lines{"The value of --avg-bandwidth is too large (at most 18446744073709551)",
                                 "The value of --burst-size is too large (at most 144115188075855871)"}));
    EXPECT_EQ(Switch("vSwitch0"), before);

    // Disabled: the values are ignored.
    r = Run("network vswitch standard policy shaping set -v vSwitch0 -b 5");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(Switch("vSwitch0"), before);
}

TEST_F(PolicyTest, PortGroupShapingOverridesAndUseVswitch) {
    EXPECT_EQ(Run("network vswitch standard portgroup policy shaping get -p Migration").out,
              "Enabled: true\nAverage Bandwidth: 5000000 Kbps\nPeak Bandwidth: 8000000 Kbps\nBurst Size: "
              "8388608 Kib\n"
              "Override Vswitch Enabled: true\nOverride Vswitch Average Bandwidth: true\n"
              "Override Vswitch Peak Bandwidth: true\nOverride Vswitch Burst Size: true\n");
    ASSERT_EQ(Run("network vswitch standard portgroup policy shaping set -p Migration -u").status, 0);
    EXPECT_EQ(Json("network vswitch standard portgroup policy shaping get -p Migration"),
              json::parse(R"({"Enabled":false,"Average Bandwidth":-1,"Peak Bandwidth":-1,"Burst Size":-1,
                  "Override Vswitch Enabled":false,"Override Vswitch Average Bandwidth":false,
                  "Override Vswitch Peak Bandwidth":false,"Override Vswitch Burst Size":false})"));

    // Without overrides the port group follows the switch.
    ASSERT_EQ(Run("network vswitch standard policy shaping set -v vSwitch1 -e true -b 1 -k 2 -t 3").status,
              0);
    auto migration = Json("network vswitch standard portgroup policy shaping get -p Migration");
    EXPECT_EQ(migration["Enabled"], true);
    EXPECT_EQ(migration["Peak Bandwidth"], 2);
    ASSERT_EQ(Run("network vswitch standard portgroup policy shaping set -p Migration -k 20").status, 0);
    migration = Json("network vswitch standard portgroup policy shaping get -p Migration");
    EXPECT_EQ(migration["Peak Bandwidth"], 20);
    EXPECT_EQ(migration["Override Vswitch Peak Bandwidth"], true);
    EXPECT_EQ(migration["Override Vswitch Enabled"], false);
}

TEST_F(PolicyTest, PortGroupShapingNeedsValuesOnThePortGroupOrTheSwitch) {
    EditHost([](json& doc) { doc["vswitches"][0]["policy"]["shaping"] = {{"enabled", false}}; });
    const json before = Switch("vSwitch0");
    auto r = Run("network vswitch standard portgroup policy shaping set -p 'VM Network' -e true -b 100");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(
        r.Errors(),
        (Lines{
            "Missing required parameter --peak-bandwidth", "Missing required parameter --burst-size",
            "Unable to set shaping policy. A Peak BPS value must be set on either this port group or on the "
            "parent virtual switch.",
            "Unable to set shaping policy. A Burst Size value must be set on either this port group or on "
            "the "
            "parent virtual switch."}));

    // Enabled on the port group already: only the port-group messages.
    EditHost([](json& doc) {
        doc["vswitches"][0]["portGroups"][1]["policy"]["shaping"] = {{"enabled", true}};
    });
    r = Run("network vswitch standard portgroup policy shaping set -p 'VM Network' -k 100");
    EXPECT_EQ(
        r.Errors(),
        (Lines{
            "Unable to set shaping policy. An Average BPS value must be set on either this port group or on "
            "the parent virtual switch.",
            "Unable to set shaping policy. A Burst Size value must be set on either this port group or on "
            "the "
            "parent virtual switch."}));
    EXPECT_EQ(Switch("vSwitch0")["portGroups"][1]["policy"]["shaping"], json({{"enabled", true}}));
}

}  // namespace
}  // namespace Hadro::Test

namespace Hadro::Test {
namespace {

// The shared policy parameters as the help shows them.
TEST_F(PolicyTest, HelpShowsTheSharedPolicyParameters) {
    auto help = [this](const std::string& path) {
        auto r = Run("--formatter=json network vswitch standard " + path + " --help");
        EXPECT_EQ(r.status, 0) << r.err;
        return json::parse(r.out);
    };
    auto failover = help("portgroup policy failover set");
    EXPECT_EQ(failover["metadata"]["type"], "operation");
    ASSERT_EQ(failover["parameters"].size(), 8u);
    EXPECT_EQ(
        failover["parameters"][1]["description"],
        "Reset all values for this policy to use parent virtual switch's settings instead of overriding the "
        "settings for the port group. Using this in conjunction with other settings will first reset all of "
        "the fields to use the virtual switch setting and then apply the other options after the reset.");
    EXPECT_EQ(
        failover["parameters"][6]["description"],
        "Configure the list of active adapters and their failover order. This list must be a comma seperated "
        "list of values with the uplink name and no spaces. Example:  "
        "--active-uplinks=vmnic0,vmnic3,vmnic7,vmnic1");
    EXPECT_EQ(failover["parameters"][2]["constraint"]["values"][3]["value"], "explicit");

    auto security = help("portgroup policy security set");
    EXPECT_NE(security["parameters"][1]["description"].get<std::string>().find("port group.   Using"),
              std::string::npos);
    EXPECT_EQ(security["parameters"][2]["short"], "o");
    EXPECT_EQ(help("policy security set")["parameters"][1]["short"], "p");

    auto shaping = help("policy shaping set");
    EXPECT_EQ(shaping["metadata"]["type"], "operator");
    EXPECT_EQ(shaping["parameters"][2]["constraint"],
              json::parse(R"({"kind":"range","min":1,"max":9223372036854775807})"));
    EXPECT_EQ(shaping["parameters"][1]["description"],
              "Indicate whether to enable traffic shaping on this policy. If this is true then the "
              "--avg-bandwidth, "
              "--peak-bandwidth and --burst-size options are required.");

    auto get = help("portgroup policy shaping get");
    EXPECT_EQ(get["formatter"], "simple");
    EXPECT_EQ(get["output-parameters"][0], json::parse(R"({"key":"header:PortGroupTrafficShapingPolicy",
        "value":"<NONE>"})"));
    EXPECT_EQ(get["output-parameters"][4],
              json::parse(R"({"key":"units:PortGroupTrafficShapingPolicy.Burst Size","value":"Kib"})"));
}

}  // namespace
}  // namespace Hadro::Test

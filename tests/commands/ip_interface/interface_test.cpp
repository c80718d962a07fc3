// "network ip interface list|add|remove|set": interfaces, their connection points and ports.
#include "ip_interface_test.h"

namespace IpInterfaceTests {
namespace {

const char* const kRules =
    "A connection point of either vswitch port group name or dvs-name/dvport-id should be specified. If "
    "connection "
    "point is DVPort, --dvs-name and --dvport-id must be specified at the same time.";
const char* const kAddFailed = "Unable to add Tarkon network interface. Error was : ";
const char* const kRemoveFailed = "Unable to remove Tarkon network interface. Error was : ";

// ---------------------------------------------------------------- list

TEST_F(IpInterfaceTest, ListShowsEachKindOfConnectionPoint) {
    auto tkn0 = Interface("tkn0");
    EXPECT_EQ(tkn0["Portset"], "vSwitch0");
    EXPECT_EQ(tkn0["Portgroup"], "Management Network");
    EXPECT_EQ(tkn0["Netstack Instance"], "defaultTcpipStack");
    EXPECT_EQ(tkn0["QBR Name"], "N/A");
    EXPECT_EQ(tkn0["QBR Connection"], -1);
    EXPECT_EQ(tkn0["Port ID"], 33554436);

    auto tkn2 = Interface("tkn2");
    EXPECT_EQ(tkn2["Portgroup"], "N/A");
    EXPECT_EQ(tkn2["QBR Name"], "dvs-prod");
    EXPECT_EQ(tkn2["QBR UUID"], "50 1e 3b 0c 7a 9d 41 2f-8e 6d 1a 2b 3c 4d 5e 6f");
    EXPECT_EQ(tkn2["QBR Port"], "30");
    EXPECT_EQ(tkn2["QBR Connection"], 1700000330);
    EXPECT_EQ(tkn2["Opaque Network ID"], "N/A");

    // An interface without a connection point, and one on an opaque network.
    EditHost([](nlohmann::json& doc) {
        doc["tknnics"][1]["connection"] = {{"type", "none"}};
        doc["tknnics"][0]["connection"] = {{"type", "opaque"},
                                           {"networkId", "net-7"},
                                           {"networkType", "overlay"},
                                           {"externalId", "ext-1"},
                                           {"portset", "opaque-sw"}};
    });
    auto none = Interface("tkn1");
    for (const char* field : {"Portset", "Portgroup", "Netstack Instance", "QBR Name", "QBR UUID", "QBR Port",
                              "Opaque Network ID", "Opaque Network Type", "External ID"}) {
        EXPECT_EQ(none[field], "N/A") << field;
    }
    EXPECT_EQ(none["QBR Connection"], -1);
    auto opaque = Interface("tkn0");
    EXPECT_EQ(opaque["Portset"], "opaque-sw");
    EXPECT_EQ(opaque["Opaque Network ID"], "net-7");
    EXPECT_EQ(opaque["Opaque Network Type"], "overlay");
    EXPECT_EQ(opaque["External ID"], "ext-1");
    EXPECT_EQ(opaque["Portgroup"], "N/A");
    EXPECT_EQ(opaque["QBR Connection"], -1);
}

TEST_F(IpInterfaceTest, ListFiltersByNetstack) {
    auto glidex = Json("network ip interface list -N glidex");
    ASSERT_EQ(glidex.size(), 1u);
    EXPECT_EQ(glidex[0]["Name"], "tkn1");
    EXPECT_EQ(Run("network ip interface list --netstack PellixProvisioning").out, "");
    EXPECT_EQ(Json("network ip interface list --netstack PellixProvisioning"), nlohmann::json::array());

    auto r = Run("network ip interface list -N nostack");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.Errors(), Strings{"Netstack instance 'nostack' does not exist"});
    EXPECT_EQ(r.out, "");
}

TEST_F(IpInterfaceTest, ListShowsNameHeadingAndReportsAFailurePlainly) {
    auto r = Run("network ip interface list -N glidex");
    EXPECT_EQ(r.out.substr(0, r.out.find("   Portset")),
              "tkn1\n   Name: tkn1\n   MAC Address: 02:48:44:00:00:11\n   Enabled: true\n");

    AddFault("HostCtl::Network::TknNic::GetMtu", "tkn1", "MTU unreadable");
    r = Run("network ip interface list");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.Errors(), Strings{"MTU unreadable"});
    EXPECT_EQ(r.out, "");
}

// ---------------------------------------------------------------- add

TEST_F(IpInterfaceTest, AddTakesAPortOfThePortGroupsSwitch) {
    auto r = Run("network ip interface add -p 'VM Network'");
    ASSERT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "");

    auto nic = Interface("tkn3");  // the lowest free name
    ASSERT_FALSE(nic.is_null());
    EXPECT_EQ(nic["Portset"], "vSwitch0");
    EXPECT_EQ(nic["Portgroup"], "VM Network");
    EXPECT_EQ(nic["MAC Address"], "02:48:44:00:00:13");
    EXPECT_EQ(nic["MTU"], 1500);
    EXPECT_EQ(nic["RXDispQueue Size"], 1);
    EXPECT_EQ(nic["TSO MSS"], 65535);
    EXPECT_EQ(nic["Enabled"], true);

    auto port = Find("ports", "client", "tkn3");
    ASSERT_FALSE(port.is_null());
    EXPECT_EQ(nic["Port ID"], port["id"]);
    EXPECT_EQ(port["switch"], "vSwitch0");
    EXPECT_EQ(port["type"], "tknnic");
    EXPECT_EQ(port["portGroup"], "VM Network");
    auto vswitch = Find("vswitches", "name", "vSwitch0");
    EXPECT_EQ(vswitch["usedPorts"], 7);
    EXPECT_EQ(vswitch["portGroups"][1]["activeClients"], 4);

    // The configuration the command gives it: router advertisement on, IPv6 off.
    auto ipv6 = Json("network ip interface ipv6 get -n tkn3");
    EXPECT_EQ(ipv6[0]["Router Adv Enabled"], true);
    EXPECT_EQ(ipv6[0]["IPv6 Enabled"], false);
}

TEST_F(IpInterfaceTest, AddTakesTheGivenNameMacMtuAndQueues) {
    ASSERT_EQ(
        Run("network ip interface add -p 'VM Network' -i tkn200 -M 02:aa:bb:cc:dd:ee -m 9000 -R 4").status,
        0);
    auto nic = Interface("tkn200");
    EXPECT_EQ(nic["MAC Address"], "02:aa:bb:cc:dd:ee");
    EXPECT_EQ(nic["MTU"], 9000);
    EXPECT_EQ(nic["RXDispQueue Size"], 4);

    // The name, the MAC and the MTU are checked by the command line and by the host.
    EXPECT_EQ(Run("network ip interface add -p 'VM Network' -i tkn256").status, 2);
    EXPECT_EQ(Run("network ip interface add -p 'VM Network' -m 1279").status, 2);
    auto r = Run("network ip interface add -p 'VM Network' -M 01:00:5e:00:00:01");
    EXPECT_EQ(r.Errors(), Strings{"Invalid unicast MAC address specified."});
    EXPECT_EQ(r.status, 1);
}

TEST_F(IpInterfaceTest, AddOnADistributedPortGivesItAConnection) {
    ASSERT_EQ(Run("network ip interface add --dvs-name dvs-prod --dvport-id 12").status, 0);
    auto nic = Interface("tkn3");
    EXPECT_EQ(nic["QBR Name"], "dvs-prod");
    EXPECT_EQ(nic["QBR Port"], "12");
    EXPECT_GT(nic["QBR Connection"].get<long>(), 0);
    EXPECT_EQ(nic["Portgroup"], "N/A");

    auto dvs = Section("dvswitches")[0];
    EXPECT_EQ(dvs["usedPorts"], 6);
    for (const auto& port : dvs["ports"]) {
        if (port["id"] != "12") continue;
        EXPECT_EQ(port["inUse"], true);
        EXPECT_EQ(port["clients"], nlohmann::json::array({"tkn3"}));
        EXPECT_EQ(port["connectionId"], nic["QBR Connection"]);
    }
    EXPECT_EQ(Find("ports", "client", "tkn3")["dvPortId"], "12");
}

TEST_F(IpInterfaceTest, ConnectionPointRulesComeFirstAndInOrder) {
    StartJournal();
    for (const char* line : {"network ip interface add", "network ip interface add -s dvs-prod",
                             "network ip interface add -p 'VM Network' -P 12",
                             "network ip interface add -s dvs-prod -M nonsense"}) {
        auto r = Run(line);
        EXPECT_EQ(r.Errors(), Strings{kRules}) << line;
        EXPECT_EQ(r.status, 1);
    }
    EXPECT_EQ(Run("network ip interface add -p 'VM Network' -s dvs-prod -P 12").Errors(),
              Strings{"Only one connection point can be specified, vswitch port group or DVPort."});
    EXPECT_TRUE(Journal().empty());

    EXPECT_EQ(Run("network ip interface add -p Nowhere").Errors(),
              Strings{"Invalid vswitch port group or DVPort parameters."});
    EXPECT_EQ(Run("network ip interface add -s dvs-prod -P 99").Errors(),
              Strings{"Invalid vswitch port group or DVPort parameters."});
    EXPECT_EQ(
        Run("network ip interface add -s dvs-none -P 12").Errors(),
        Strings{"Unable to retrieve DVS info by specified DVS name dvs-none. Error was: Distributed switch "
                "dvs-none does not exist"});
    AddFault("HostCtl::Network::DVSwitch::GetUuid", "dvs-prod", "switch busy");
    EXPECT_EQ(Run("network ip interface add -s dvs-prod -P 12").Errors(),
              Strings{"Unable to retrieve DVS info by specified DVS name dvs-prod. Error was: switch busy"});
    EXPECT_EQ(Section("tknnics").size(), 3u);
}

TEST_F(IpInterfaceTest, TheHostRefusesWhatARealHostWould) {
    auto refused = [&](const std::string& line, const std::string& why) {
        auto r = Run(line);
        EXPECT_EQ(r.Errors(), Strings{kAddFailed + why}) << line;
        EXPECT_EQ(r.status, 1);
    };
    refused("network ip interface add -p 'Management Network'",
            "The port group 'Management Network' already has a Tarkon network interface (tkn0)");
    refused("network ip interface add -p 'VM Network' -i tkn1",
            "A Tarkon network interface named tkn1 already exists");
    refused("network ip interface add -p 'VM Network' -N nostack",
            "Netstack instance 'nostack' does not exist");
    refused("network ip interface add -p 'VM Network' -M 02:48:44:00:00:10",
            "MAC address 02:48:44:00:00:10 is already in use");
    refused("network ip interface add -s dvs-prod -P 10",
            "The distributed port '10' of dvs-prod is in use by db-01.eth0");
    EditHost([](nlohmann::json& doc) { doc["vswitches"][0]["usedPorts"] = 128; });
    refused("network ip interface add -p 'VM Network'",
            "Virtual switch vSwitch0 has no free port (128 ports, all in use)");
    EXPECT_EQ(Section("tknnics").size(), 3u);
}

TEST_F(IpInterfaceTest, DedicatedNetstacksMoveTheirTag) {
    // tkn0 (default netstack) and tkn1 (glidex) carry the Glidex tag.
    EditHost([](nlohmann::json& doc) { doc["tknnics"][0]["tags"].push_back("Glidex"); });
    StartJournal();
    ASSERT_EQ(Run("network ip interface add -p 'VM Network' -N glidex").status, 0);
    auto tags = Journal("HostCtl::Network::TknNic::AddTag");
    ASSERT_EQ(tags, Strings{"HostCtl::Network::TknNic::AddTag tkn3 Glidex false"});
    auto journal = Journal();
    auto added = std::find(journal.begin(), journal.end(), tags[0]);
    auto removed =
        std::find(journal.begin(), journal.end(), "HostCtl::Network::TknNic::RemoveTag tkn0 Glidex");
    EXPECT_LT(added, removed);
    EXPECT_EQ(Journal("HostCtl::Network::TknNic::RemoveTag").size(), 1u);
    EXPECT_EQ(Json("network ip interface tag get -i tkn0")["Tags"], nlohmann::json::array({"Management"}));
    EXPECT_EQ(Json("network ip interface tag get -i tkn1")["Tags"], nlohmann::json::array({"Glidex"}));
    EXPECT_EQ(Json("network ip interface tag get -i tkn3")["Tags"], nlohmann::json::array({"Glidex"}));

    // A netstack the host does not have yet is created for its interface.
    ASSERT_EQ(Run("network ip interface add -s dvs-prod -P 12 -N faultTolerance").status, 0) << Export();
    EXPECT_EQ(Find("netstacks", "key", "faultTolerance")["state"], 4660);
    EXPECT_EQ(Json("network ip interface tag get -i tkn4")["Tags"],
              nlohmann::json::array({"faultToleranceLogging"}));
}

TEST_F(IpInterfaceTest, ProvisioningEnablesItsNetstackAndRestartsTheDaemon) {
    ASSERT_EQ(Find("netstacks", "key", "PellixProvisioning")["state"], 0);
    StartJournal();
    ASSERT_EQ(Run("network ip interface add -p 'VM Network' -N PellixProvisioning").status, 0);
    EXPECT_EQ(Journal("TknCtl::Util::TknCtl_Exec"),
              Strings{"TknCtl::Util::TknCtl_Exec /etc/init.d/nfcd restart"});
    EXPECT_EQ(Find("netstacks", "key", "PellixProvisioning")["state"], 4660);
    EXPECT_EQ(Json("network ip interface tag get -i tkn3")["Tags"],
              nlohmann::json::array({"PellixProvisioning"}));

    // A failed restart is reported; the interface is made and configured all the same.
    ASSERT_EQ(Run("network ip interface remove -i tkn3").status, 0);
    AddFault("TknCtl::Util::TknCtl_Exec");
    StartJournal();
    auto r = Run("--formatter=json network ip interface add -p 'VM Network' -N PellixProvisioning");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(
        r.Errors(),
        Strings{"Unable to start the NFC daemon. Take a look at /var/log/nfcd.log for more information."});
    EXPECT_EQ(r.out, "true\n");
    EXPECT_EQ(Journal("HostCtl::Network::TknNic::Refresh"),
              Strings{"HostCtl::Network::TknNic::Refresh tkn3"});
}

TEST_F(IpInterfaceTest, TheNewInterfaceIsRefreshedAfterItsConfiguration) {
    StartJournal();
    ASSERT_EQ(Run("network ip interface add -p 'VM Network'").status, 0);
    auto journal = Journal();
    ASSERT_GE(journal.size(), 2u);
    EXPECT_EQ(journal[journal.size() - 2], "HostCtl::Network::TknNic::SetIpConfig tkn3");
    EXPECT_EQ(journal.back(), "HostCtl::Network::TknNic::Refresh tkn3");

    // A failure after the creation is reported; the interface stays.
    AddFault("HostCtl::Network::TknNic::Refresh", "", "refresh failed");
    auto r = Run("network ip interface add -s dvs-prod -P 12");
    EXPECT_EQ(r.Errors(), Strings{std::string(kAddFailed) + "refresh failed"});
    EXPECT_FALSE(Interface("tkn4").is_null());
}

// ---------------------------------------------------------------- remove

TEST_F(IpInterfaceTest, RemoveTakesEverythingOfTheInterfaceWithIt) {
    ASSERT_EQ(Run("network ip interface remove -i tkn0").status, 0);
    EXPECT_TRUE(Interface("tkn0").is_null());
    EXPECT_TRUE(Find("ports", "client", "tkn0").is_null());
    auto vswitch = Find("vswitches", "name", "vSwitch0");
    EXPECT_EQ(vswitch["usedPorts"], 5);
    EXPECT_EQ(vswitch["portGroups"][0]["activeClients"], 0);
    std::string rest = Section("routes").dump() + Section("neighbors").dump() + Section("multicast").dump();
    EXPECT_EQ(rest.find("\"tkn0\""), std::string::npos) << rest;
    EXPECT_NE(rest.find("\"tkn2\""), std::string::npos);

    // The port group is free again.
    ASSERT_EQ(Run("network ip interface add -p 'Management Network' -i tkn0").status, 0);
    EXPECT_EQ(Interface("tkn0")["Portgroup"], "Management Network");
}

TEST_F(IpInterfaceTest, RemoveByConnectionPoint) {
    ASSERT_EQ(Run("network ip interface remove -s dvs-prod -P 30").status, 0);
    EXPECT_TRUE(Interface("tkn2").is_null());
    auto dvs = Section("dvswitches")[0];
    EXPECT_EQ(dvs["usedPorts"], 4);
    for (const auto& port : dvs["ports"]) {
        if (port["id"] == "30") {
            EXPECT_EQ(port["clients"], nlohmann::json::array());
            EXPECT_EQ(port["inUse"], false);
        }
    }
    ASSERT_EQ(Run("network ip interface remove -p Migration -N glidex").status, 0);
    EXPECT_TRUE(Interface("tkn1").is_null());
}

TEST_F(IpInterfaceTest, RemoveMessages) {
    const std::string unique =
        "Please correctly and uniquely specify a way to remove it. A Tarkon network interface can be "
        "uniquely "
        "specified by --interface-name or --portgroup-name or --dvs-name/--dvport-id. i.e. Providing its "
        "name or its "
        "connection point are two ways to uniquely specify a Tarkon network interface.";
    EXPECT_EQ(Run("network ip interface remove").Errors(), Strings{unique});
    EXPECT_EQ(Run("network ip interface remove -i tkn0 -p 'Management Network'").Errors(), Strings{unique});
    EXPECT_EQ(Run("network ip interface remove -s dvs-prod").Errors(), Strings{kRules});

    auto r = Run("network ip interface remove -i tkn9");
    EXPECT_EQ(r.Errors(), Strings{"Unable to find Tarkon network interface with the name tkn9"});
    EXPECT_EQ(r.out, "false\n");
    EXPECT_EQ(r.status, 1);

    EXPECT_EQ(Run("network ip interface remove -p 'VM Network'").Errors(),
              Strings{std::string(kRemoveFailed) +
                      "No Tarkon network interface is attached to port group 'VM Network'"});
    EXPECT_EQ(
        Run("network ip interface remove -p Migration").Errors(),
        Strings{
            std::string(kRemoveFailed) +
            "The Tarkon network interface at port group 'Migration' (tkn1) belongs to netstack 'glidex', not "
            "'defaultTcpipStack'"});
    AddFault("HostCtl::Network::TknNic::Remove", "tkn0", "interface busy");
    EXPECT_EQ(Run("network ip interface remove -i tkn0").Errors(),
              Strings{std::string(kRemoveFailed) + "interface busy"});
    EXPECT_EQ(Section("tknnics").size(), 3u);
}

// ---------------------------------------------------------------- set

TEST_F(IpInterfaceTest, SetChangesEnabledAndMtu) {
    ASSERT_EQ(Run("network ip interface set -i tkn0 -e false -m 9000").status, 0);
    EXPECT_EQ(Interface("tkn0")["Enabled"], false);
    EXPECT_EQ(Interface("tkn0")["MTU"], 9000);

    // A negative MTU is refused by the command; the enabled change stays.
    auto r = Run("network ip interface set -i tkn0 -e true -m -1");
    EXPECT_EQ(r.Errors(), Strings{"MTU size should be a positive value"});
    EXPECT_EQ(Interface("tkn0")["Enabled"], true);
    // 0 and values beyond any MTU go to the host, which gives its bounds.
    EXPECT_EQ(Run("network ip interface set -i tkn0 -m 0").Errors(),
              Strings{"Invalid MTU 0: it must be between 1280 and 9000"});
    EXPECT_EQ(Run("network ip interface set -i tkn0 -m 4294968576").Errors(),
              Strings{"Invalid MTU 2147483647: it must be between 1280 and 9000"});
    EXPECT_EQ(Interface("tkn0")["MTU"], 9000);

    EXPECT_EQ(Run("network ip interface set -i tkn7 -e true").Errors(),
              Strings{"Unable to find an interface with name tkn7"});
    AddFault("HostCtl::Network::TknNic::Disable", "tkn0", "cannot disable");
    EXPECT_EQ(Run("network ip interface set -i tkn0 -e false").Errors(), Strings{"cannot disable"});
}

TEST_F(IpInterfaceTest, HelpShowsTheParametersAsDeclared) {
    auto help = Json("network ip interface add --help");
    EXPECT_EQ(help["metadata"]["type"], "operation");
    EXPECT_EQ(help["formatter"], "");
    Strings names;
    for (const auto& p : help["parameters"])
        names.push_back(p["name"].get<std::string>() + "/" + p["short"].get<std::string>());
    EXPECT_EQ(names, (Strings{"netstack/N", "portgroup-name/p", "dvs-name/s", "dvport-id/P", "mtu/m",
                              "num-rxqueue/R", "mac-address/M", "interface-name/i"}));
    EXPECT_EQ(help["parameters"][4]["constraint"],
              nlohmann::json::parse(R"({"kind":"range","min":1280,"max":9000})"));
    EXPECT_EQ(help["parameters"][7]["constraint"]["pattern"],
              "tkn([0-9]|[1-9][0-9]|1[0-9][0-9]|2[0-4][0-9]|25[0-5])");

    auto list = Json("network ip interface list --help");
    EXPECT_EQ(list["formatter"], "simple");
    EXPECT_EQ(list["output-parameters"][0]["key"], "header:NetworkInterface");
    EXPECT_EQ(Json("network ip interface set --help")["description"],
              "This command sets the enabled status and MTU size of a given IP interface ");
}

}  // namespace
}  // namespace IpInterfaceTests

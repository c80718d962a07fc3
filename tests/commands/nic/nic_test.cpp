// "network nic" list, get, set, up and down on fixture hosts.
#include <nlohmann/json.hpp>

#include "harness.h"

namespace {

using nlohmann::json;

class NicTest : public Hadro::Test::CommandTest {
protected:
    // Runs a command with the json formatter; it must succeed.
    json Json(const std::string& commandLine) {
        auto r = Run("--formatter=json " + commandLine);
        EXPECT_EQ(r.status, 0) << commandLine << ": " << r.err;
        return r.out.empty() ? json() : json::parse(r.out);
    }
    // Runs a command that must fail with exactly one message, and returns it.
    std::string Error(const std::string& commandLine) {
        auto r = Run(commandLine);
        EXPECT_EQ(r.status, 1) << commandLine;
        EXPECT_EQ(r.out, "") << commandLine;
        auto errors = r.Errors();
        EXPECT_EQ(errors.size(), 1u) << commandLine << ": " << r.err;
        return errors.empty() ? std::string() : errors.front();
    }
    json Nic(const std::string& name) {
        for (const auto& nic : Section("pnics"))
            if (nic["name"] == name) return nic;
        return json();
    }
    // Changes one adapter of the host before the test runs commands.
    void EditNic(const std::string& name, const std::function<void(json&)>& edit) {
        EditHost([&](json& doc) {
            for (auto& nic : doc["pnics"])
                if (nic["name"] == name) edit(nic);
        });
    }
    json ListEntry(const json& list, const std::string& field, const std::string& name) {
        for (const auto& entry : list)
            if (entry[field] == name) return entry;
        ADD_FAILURE() << "no entry " << name;
        return json();
    }
};

// ---------------------------------------------------------------- list

TEST_F(NicTest, ListShowsEveryAdapterInHostOrder) {
    auto list = Json("network nic list");
    ASSERT_EQ(list.size(), 7u);
    EXPECT_EQ(list[0],
              json::parse(R"({"Name":"vmnic0","PCI Device":"0000:04:00.0","Driver":"cvx10","Link":"Up",
                  "Admin Status":"Up","Link Status":"Up","Speed":10000,"Duplex":"Full",
                  "MAC Address":"0a:8e:41:10:00:00","MTU":1500,
                  "Description":"Corvane Networks CX-4210 10GbE SFP+ Adapter"})"));
    // No carrier: link down, no speed, half duplex.
    EXPECT_EQ(list[2]["Link"], "Down");
    EXPECT_EQ(list[2]["Link Status"], "Down");
    EXPECT_EQ(list[2]["Speed"], 0);
    EXPECT_EQ(list[2]["Duplex"], "Half");
    // The USB adapter is a pseudo adapter described by its USB vendor and device.
    EXPECT_EQ(list[4]["PCI Device"], "Pseudo");
    EXPECT_EQ(list[4]["Description"], "Lumen LU-8153 Gigabit Ethernet");

    auto table = Run("network nic list");
    EXPECT_EQ(table.status, 0);
    EXPECT_EQ(
        table.out.substr(0, table.out.find('\n')),
        "Name    PCI Device    Driver  Admin Status  Link Status  Speed  Duplex  MAC Address        MTU   "
        "Description");
}

TEST_F(NicTest, ListDescribesPseudoAdaptersAndDuplexCodes) {
    EditHost([](json& doc) {
        auto usb = doc["pnics"][4];
        doc["pnics"] = json::array();
        auto add = [&](const std::string& name, const std::string& description) {
            auto nic = usb;
            nic["name"] = name;
            nic["description"] = description;
            doc["pnics"].push_back(nic);
        };
        add("usb0", "USB-NIC:Acme:Dongle");
        add("usb1", "USB-NIC:Acme");          // no device piece
        add("usb2", "PCIe-NIC:Acme:Dongle");  // not a USB description
        add("usb3", "");
        add("usb4", "USB-NIC::Acme:Dongle:Extra");  // empty pieces are skipped, extra ones ignored
        // Only the first 63 characters are looked at.
        add("usb5", "USB-NIC:" + std::string(50, 'v') + ":DeviceNameBeyondTheLimit");
        doc["pnics"][0]["duplex"] = 0;  // any code but 1 is half
        doc["pnics"][1]["duplex"] = 7;
    });
    auto list = Json("network nic list");
    ASSERT_EQ(list.size(), 6u);
    EXPECT_EQ(list[0]["Description"], "Acme Dongle");
    EXPECT_EQ(list[0]["Duplex"], "Half");
    EXPECT_EQ(list[1]["Description"], "Acme Unknown");
    EXPECT_EQ(list[1]["Duplex"], "Half");
    EXPECT_EQ(list[2]["Description"], "Unknown Unknown");
    EXPECT_EQ(list[3]["Description"], "Unknown Unknown");
    EXPECT_EQ(list[4]["Description"], "Acme Dongle");
    EXPECT_EQ(list[5]["Description"], std::string(50, 'v') + " Devi");
    for (const auto& nic : list)
        EXPECT_EQ(nic["PCI Device"], "Pseudo");
}

TEST_F(NicTest, ListFailures) {
    // A description that cannot be read leaves the record in the list, unknown.
    AddFault("HostCtl::Network::Pnic::GetDeviceDescription", "vmnic4", "no description");
    auto list = Json("network nic list");
    EXPECT_EQ(list[4]["Description"], "Unknown Unknown");

    AddFault("HostCtl::Network::Pnic::GetMtu", "vmnic3", "driver gone");
    EXPECT_EQ(Error("network nic list"), "Unable to list NICs.  Error was driver gone");
    AddFault("TknCtl::Network::NetworkInfoImpl::GetPnics", "", "no adapters");
    EXPECT_EQ(Error("network nic list"), "Unable to list NICs.  Error was no adapters");
}

// ---------------------------------------------------------------- get

TEST_F(NicTest, GetShowsTheWholeRecord) {
    EXPECT_EQ(Json("network nic get -n vmnic1"), json::parse(R"J({
        "Name":"vmnic1","Supported Ports":["FIBRE"],"Supports Auto Negotiation":true,
        "Advertised Link Modes":["10000BaseSR/Full"],"Advertised Auto Negotiation":true,"Cable Type":"FIBRE",
        "PHY Address":1,"Virtual Address":"","Transceiver":"internal","Auto Negotiation":true,
        "Supports Wakeon":true,"Wakeon":["MagicPacket(tm)"],"Current Message Level":7,"Link Detected":true,
        "Supports Pause":true,"Pause Autonegotiate":true,"Pause RX":true,"Pause TX":true,"Link Status":"Up",
        "Driver Info":{"Driver":"cvx10","Version":"3.1.4.0","Firmware Version":"8.50 0x80009b2e 1.3082.0",
                       "Bus Info":"0000:04:00.1"}})J"));
}

TEST_F(NicTest, GetWakeOnMessageLevelAndPauseRules) {
    // No Wake-on at all: the single entry "None".
    auto vmnic0 = Json("network nic get --nic-name vmnic0");
    EXPECT_EQ(vmnic0["Supports Wakeon"], false);
    EXPECT_EQ(vmnic0["Wakeon"], json::array({"None"}));
    // Wake-on supported, no mode set: an empty list.
    auto vmnic2 = Json("network nic get --nic-name vmnic2");
    EXPECT_EQ(vmnic2["Supports Wakeon"], true);
    EXPECT_EQ(vmnic2["Wakeon"], json::array());
    EXPECT_EQ(vmnic2["Link Detected"], false);
    EXPECT_EQ(vmnic2["Link Status"], "Down");
    // No message level and no pause on the USB adapter.
    auto vmnic4 = Json("network nic get --nic-name vmnic4");
    EXPECT_EQ(vmnic4["Current Message Level"], -1);
    EXPECT_EQ(vmnic4["Supports Pause"], false);
    EXPECT_EQ(vmnic4["Pause RX"], false);
    EXPECT_EQ(vmnic4["Driver Info"]["Firmware Version"], "");

    EditNic("vmnic3", [](json& nic) {
        nic["settings"]["wakeOn"] = {0, 1, 2, 3, 4, 5, 6};
        nic["pause"] = {{"supported", true}, {"autoNegotiate", false}, {"rx", true}, {"tx", false}};
    });
    auto vmnic3 = Json("network nic get --nic-name vmnic3");
    EXPECT_EQ(vmnic3["Wakeon"], json::parse(R"J(["PHY Activity","Unicast Messagess","Multicast Messages",
        "Broadcast Messages","ARP","MagicPacket(tm)",
        "Enable SecureOn(tm) Password for                            MagicPacket(tm)"])J"));
    EXPECT_EQ(vmnic3["Wakeon"][6].get<std::string>().size(), 75u);
    EXPECT_EQ(vmnic3["Pause Autonegotiate"], false);
    EXPECT_EQ(vmnic3["Pause RX"], true);
    EXPECT_EQ(vmnic3["Pause TX"], false);
}

TEST_F(NicTest, GetLinkModeAndPortTexts) {
    EditNic("vmnic3", [](json& nic) {
        nic["settings"]["advertisedModes"] = json::parse(R"([
            {"speed":0,"duplex":1,"media":40}, {"speed":1000,"duplex":1,"media":2},
            {"speed":100,"duplex":2,"media":26}, {"speed":10,"duplex":0,"media":0},
            {"speed":40000,"duplex":1,"media":40}, {"speed":2500,"duplex":3,"media":27}])");
        nic["settings"]["supportedPorts"] = {0, 1, 2, 3, 4, 5, 9};
        nic["settings"]["port"] = 9;
        nic["settings"]["transceiver"] = 4;
    });
    auto record = Json("network nic get -n vmnic3");
    EXPECT_EQ(
        record["Advertised Link Modes"],
        json::parse(R"(["Auto","1000BaseT/Full","100BaseCX-SGMII/Half","10None/Auto","40000Unknown/Full",
                  "2500Unknown/"])"));
    EXPECT_EQ(record["Supported Ports"], json::parse(R"(["TP","AUI","BNC","MII","FIBRE","DA","UNKNOWN"])"));
    EXPECT_EQ(record["Cable Type"], "");
    EXPECT_EQ(record["Transceiver"], "");
    EXPECT_EQ(Json("network nic get -n vmnic2")["Cable Type"], "Twisted Pair");
}

TEST_F(NicTest, GetFailures) {
    EXPECT_EQ(Error("network nic get -n vmnic9"), "There is no pnic with name vmnic9");
    AddFault("HostCtl::Network::Pnic::GetDriverInfo", "vmnic0", "driver info unavailable");
    EXPECT_EQ(Error("network nic get -n vmnic0"), "driver info unavailable");
    StartJournal();
    AddFault("HostCtl::Network::Pnic::GetPnicInfo", "vmnic1", "settings unavailable");
    EXPECT_EQ(Error("network nic get -n vmnic1"), "settings unavailable");
}

// ---------------------------------------------------------------- set

TEST_F(NicTest, SetParameterRulesComeBeforeTheLookup) {
    EXPECT_EQ(Error("network nic set -n vmnic9 --speed 1000"),
              "The --speed and --duplex options must be specified together");
    EXPECT_EQ(Error("network nic set -n vmnic9 --duplex full --auto"),
              "The --speed and --duplex options must be specified together");
    EXPECT_EQ(Error("network nic set -n vmnic9 --speed 1000 --duplex full --auto"),
              "The options --speed and --duplex cannot be specified with the --auto option.");
    EXPECT_EQ(Error("network nic set -n vmnic9 --auto"), "There is no pnic with name vmnic9");
}

TEST_F(NicTest, SetWithoutChange) {
    EXPECT_EQ(Error("network nic set -n vmnic0"), "There is no change for nic vmnic0");
    EXPECT_EQ(Error("network nic set -n vmnic0 --phy-address -1"), "There is no change for nic vmnic0");
    EXPECT_EQ(Error("network nic set -n vmnic1 --phy-address 1"), "There is no change for nic vmnic1");
    EXPECT_EQ(Error("network nic set -n vmnic2 --port tp"), "There is no change for nic vmnic2");
    EXPECT_EQ(Error("network nic set -n vmnic0 --message-level 7 --transceiver-type internal"),
              "There is no change for nic vmnic0");
    EXPECT_EQ(Error("network nic set -n vmnic0 --virtual-address ''"), "There is no change for nic vmnic0");
    StartJournal();
    EXPECT_EQ(Json("network nic set -n vmnic0 --auto"), true);
    EXPECT_TRUE(Journal("HostCtl::Network::Pnic::SetPnicInfo").empty());
    EXPECT_EQ(Journal("HostCtl::Network::Pnic::SetSpeedDuplex"),
              std::vector<std::string>{"HostCtl::Network::Pnic::SetSpeedDuplex vmnic0 0 0"});
}

TEST_F(NicTest, SetMergeFailures) {
    EXPECT_EQ(Error("network nic set -n vmnic0 --phy-address 0"), "Invalid PHY address value.");
    EXPECT_EQ(Error("network nic set -n vmnic1 --phy-address -2"), "Invalid PHY address value.");
    EXPECT_EQ(Error("network nic set -n vmnic1 --wake-on-lan d"), "Invalid wol value.");
    EXPECT_EQ(Error("network nic set -n vmnic1 --wake-on-lan gd"), "Invalid wol value.");
    EXPECT_EQ(Error("network nic set -n vmnic0 --wake-on-lan d"), "Not Support wol.");
    EXPECT_EQ(Error("network nic set -n vmnic4 --message-level 3"), "Not Support msglvl.");
    // A failing merge applies nothing, not even the parts before it.
    StartJournal();
    EXPECT_EQ(Error("network nic set -n vmnic2 --phy-address 4 --wake-on-lan pd --auto"),
              "Invalid wol value.");
    EXPECT_TRUE(Journal("HostCtl::Network::Pnic::Set").empty());
    EXPECT_EQ(Nic("vmnic2")["settings"]["phyAddress"], 1);
}

TEST_F(NicTest, SetAppliesMarkedSettingsThenTheLink) {
    StartJournal();
    EXPECT_EQ(Json("network nic set -n vmnic3 -P 7 -V 02:00:00:00:00:07 -t external -w gubg -l 3 -S 100 "
                   "-D half"),
              true);
    EXPECT_EQ(Journal("HostCtl::Network::Pnic::"),
              (std::vector<std::string>{
                  "HostCtl::Network::Pnic::GetPnicInfo vmnic3",
                  "HostCtl::Network::Pnic::SetPnicInfo vmnic3 phyAddress=7 virtualAddress=02:00:00:00:00:07 "
                  "transceiver=1 wakeOn=5,1,3,5 messageLevel=3",
                  "HostCtl::Network::Pnic::SetSpeedDuplex vmnic3 100 2"}));
    auto nic = Nic("vmnic3");
    EXPECT_EQ(nic["settings"]["phyAddress"], 7);
    EXPECT_EQ(nic["settings"]["virtualAddress"], "02:00:00:00:00:07");
    EXPECT_EQ(nic["settings"]["transceiver"], 1);
    EXPECT_EQ(nic["settings"]["wakeOn"], json::parse("[5,1,3]"));  // the driver keeps a set
    EXPECT_EQ(nic["settings"]["messageLevel"], 3);
    EXPECT_EQ(nic["settings"]["autoNegotiation"], false);
    auto list = Json("network nic list");
    EXPECT_EQ(list[3]["Speed"], 100);
    EXPECT_EQ(list[3]["Duplex"], "Half");
    // Auto-negotiation settles on the fastest advertised mode again.
    EXPECT_EQ(Json("network nic set -n vmnic3 -a"), true);
    EXPECT_EQ(Json("network nic list")[3]["Speed"], 1000);
    EXPECT_EQ(Json("network nic get -n vmnic3")["Auto Negotiation"], true);
    // Every Wake-on letter.
    EXPECT_EQ(Json("network nic set -n vmnic3 -w pumbags"), true);
    EXPECT_EQ(Nic("vmnic3")["settings"]["wakeOn"], json::parse("[0,1,2,3,4,5,6]"));
}

TEST_F(NicTest, SetRefusesWhatTheAdapterLacks) {
    EXPECT_EQ(Error("network nic set -n vmnic2 --port fibre"),
              "Port FIBRE is not supported by vmnic2 (supported: TP)");
    EXPECT_EQ(Error("network nic set -n vmnic1 --phy-address 32"),
              "PHY address 32 is out of range (0 to 31)");
    EXPECT_EQ(Error("network nic set -n vmnic1 --wake-on-lan a"), "vmnic1 does not support Wake-on ARP");
    EXPECT_EQ(Error("network nic set -n vmnic1 --message-level -1"),
              "Message level -1 is out of range (0 to 4294967295)");
    EXPECT_EQ(Error("network nic set -n vmnic1 --virtual-address ff:ff:ff:ff:ff:ff"),
              "Invalid virtual address 'ff:ff:ff:ff:ff:ff': expected a unicast MAC address such as "
              "02:00:00:00:00:01");
    EXPECT_EQ(Error("network nic set -n vmnic0 --speed 10000 --duplex half"),
              "vmnic0 does not support 10000 Mbps half duplex (supported: 1000/full, 10000/full)");
    EXPECT_EQ(Error("network nic set -n vmnic0 -S 100000 -D full"),
              "vmnic0 does not support 100000 Mbps full duplex (supported: 1000/full, 10000/full)");
    EditNic("vmnic0", [](json& nic) { nic["settings"]["supportsAutoNegotiation"] = false; });
    EXPECT_EQ(Error("network nic set -n vmnic0 --auto"), "vmnic0 does not support auto-negotiation");
    // Settings applied before a refused link change stay applied.
    EXPECT_EQ(Error("network nic set -n vmnic0 -l 9 -S 10 -D full"),
              "vmnic0 does not support 10 Mbps full duplex (supported: 1000/full, 10000/full)");
    EXPECT_EQ(Nic("vmnic0")["settings"]["messageLevel"], 9);
}

TEST_F(NicTest, SetHostFailures) {
    AddFault("HostCtl::Network::Pnic::SetPnicInfo", "vmnic1", "driver refused");
    EXPECT_EQ(Error("network nic set -n vmnic1 -P 3"), "driver refused");
    AddFault("HostCtl::Network::Pnic::SetSpeedDuplex", "vmnic1", "link busy");
    EXPECT_EQ(Error("network nic set -n vmnic1 --auto"), "link busy");
}

// ---------------------------------------------------------------- up and down

TEST_F(NicTest, DownDropsTheLinkAndUpRestoresItWithACarrier) {
    EXPECT_EQ(Json("network nic down -n vmnic0"), true);
    auto down = Json("network nic list")[0];
    EXPECT_EQ(down["Admin Status"], "Down");
    EXPECT_EQ(down["Link"], "Down");
    EXPECT_EQ(down["Link Status"], "Down");
    EXPECT_EQ(down["Speed"], 0);
    EXPECT_EQ(Json("network nic get -n vmnic0")["Link Detected"], false);
    EXPECT_EQ(
        ListEntry(Json("network nic pauseParams list"), "NIC", "vmnic0")["Auto Negotiation Resolution Avail"],
        false);

    EXPECT_EQ(Json("network nic up -n vmnic0"), true);
    auto up = Json("network nic list")[0];
    EXPECT_EQ(up["Admin Status"], "Up");
    EXPECT_EQ(up["Link Status"], "Up");
    EXPECT_EQ(up["Speed"], 10000);
    EXPECT_EQ(up["Duplex"], "Full");

    // Without a carrier the link stays down.
    EXPECT_EQ(Json("network nic down -n vmnic2"), true);
    EXPECT_EQ(Json("network nic up -n vmnic2"), true);
    auto vmnic2 = Json("network nic list")[2];
    EXPECT_EQ(vmnic2["Admin Status"], "Up");
    EXPECT_EQ(vmnic2["Link"], "Down");
}

TEST_F(NicTest, UpDownFailures) {
    EXPECT_EQ(Error("network nic up -n vmnic9"), "There is no pnic with name vmnic9");
    EXPECT_EQ(Error("network nic down -n vmnic9"), "There is no pnic with name vmnic9");
    AddFault("HostCtl::Network::Pnic::SetAdminUp", "vmnic0", "firmware hung");
    EXPECT_EQ(Error("network nic down -n vmnic0"), "firmware hung");
    EXPECT_EQ(Error("network nic up -n vmnic0"), "firmware hung");
    EXPECT_EQ(Nic("vmnic0")["adminUp"], true);
}

}  // namespace

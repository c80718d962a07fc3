// The switches of the Linux host below the kernel: what the document keeps of them, which
// interfaces count as NICs, and how each policy becomes port flags, token buckets, VLANs, or a
// refusal.
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>

#include <nlohmann/json.hpp>

#include "core/config.h"
#include "network/pnic.h"
#include "network/vswitch.h"

namespace {

using namespace TknCtl::Linux;
using nlohmann::json;
namespace Net = HostCtl::Network;

TEST(SwitchRecords, TheDocumentReadsBackAsWritten) {
    SwitchRecords records;
    SwitchRecord record;
    record.ports = 64;
    record.cdpStatus = 3;
    record.beaconRequiredBy = {"vmk"};
    record.policy.teaming.SetTeamingPolicy(Net::NicTeamingPolicy::TEAM_SRCMAC);
    Net::LinkCriteriaSelectionPolicy criteria;  // set, with its beacon field unset
    record.policy.teaming.SetLinkCriteria(criteria);
    record.policy.teaming.SetUplinkOrder({"eth1"});
    record.policy.teaming.SetMaxActiveUplinks(1);
    record.policy.security.SetAllowMacAddressChange(true);
    record.policy.shaping.SetEnabled(true);
    record.policy.shaping.SetBurstSize(1ull << 40);
    PortGroupRecord group;
    group.name = "VM Network";
    group.vlanId = 4095;
    group.ports = {"vp0"};
    group.policy.security.SetAllowForgedTransmits(true);
    record.portGroups.push_back(group);
    records["br0"] = record;
    records["br1"] = SwitchRecord();

    const json written = SwitchRecordsJson(records);
    // As written in this session (signed numbers among them), and as read from the file.
    EXPECT_EQ(ParseSwitchRecords(written), records);
    EXPECT_EQ(ParseSwitchRecords(json::parse(written.dump())), records);
    // Only the fields that are set are written: a port group's overrides stay overrides.
    EXPECT_EQ(written["br0"]["portGroups"][0]["policy"],
              json::parse(R"({"security":{"allowForgedTransmits":true}})"));
    EXPECT_EQ(written["br0"]["policy"]["teaming"]["linkCriteria"], json::object());
    EXPECT_TRUE(ParseSwitchRecords(json()).empty());
}

TEST(SwitchRecords, ADamagedMemberIsRefusedSayingWhere) {
    auto fault = [](const char* text) {
        try {
            ParseSwitchRecords(json::parse(text));
        } catch (const std::invalid_argument& e) {
            return std::string(e.what());
        }
        return std::string("accepted");
    };
    EXPECT_EQ(fault("[]"), "not an object");
    EXPECT_EQ(fault(R"({"a/b":{}})"), "'a/b': no name a bridge can have");
    EXPECT_EQ(fault(R"({"br0":{"ports":0}})"), "'br0': member 'ports' is unknown or of the wrong type");
    EXPECT_EQ(fault(R"({"br0":{"cdpStatus":4}})"),
              "'br0': member 'cdpStatus' is unknown or of the wrong type");
    EXPECT_EQ(fault(R"({"br0":{"color":"red"}})"), "'br0': member 'color' is unknown or of the wrong type");
    EXPECT_EQ(fault(R"({"br0":{"policy":{"teaming":{"loadBalancing":5}}}})"),
              "'br0'.policy.teaming: member 'loadBalancing' is unknown or of the wrong type");
    EXPECT_EQ(fault(R"({"br0":{"policy":{"shaping":{"averageBps":-1}}}})"),
              "'br0'.policy.shaping: member 'averageBps' is unknown or of the wrong type");
    EXPECT_EQ(fault(R"({"br0":{"portGroups":[{"vlanId":1}]}})"),
              "'br0'.portGroups: a port group needs a name");
    EXPECT_EQ(fault(R"({"br0":{"portGroups":[{"name":"a","vlanId":4096}]}})"),
              "'br0'.portGroups: member 'vlanId' is unknown or of the wrong type");
    EXPECT_EQ(fault(R"({"br0":{"portGroups":[{"name":"a"}]},"br1":{"portGroups":[{"name":"a"}]}})"),
              "'br1': port group 'a' appears twice");
    EXPECT_EQ(fault(R"({"br0":{"beacon":{"requiredBy":[1]}}})"),
              "'br0'.beacon: member 'requiredBy' is unknown or of the wrong type");
}

TEST(SwitchUplinks, ANicHasADeviceOrIsNamedByTheConfiguration) {
    const auto sysfs =
        std::filesystem::temp_directory_path() / ("hadro-switches-" + std::to_string(getpid()));
    std::filesystem::create_directories(sysfs / "class/net/eno1/device");
    std::filesystem::create_directories(sysfs / "class/net/veth7");
    const auto config = Config::Parse("nics = up? uplink-*\n", "test");
    EXPECT_TRUE(IsPhysicalNic(config, sysfs.string(), "eno1"));
    EXPECT_FALSE(IsPhysicalNic(config, sysfs.string(), "veth7"));
    EXPECT_TRUE(IsPhysicalNic(config, sysfs.string(), "up1"));
    EXPECT_TRUE(IsPhysicalNic(config, sysfs.string(), "uplink-a"));
    EXPECT_FALSE(IsPhysicalNic(config, sysfs.string(), "up12"));
    EXPECT_FALSE(IsPhysicalNic(config, sysfs.string(), "../class/net/eno1"));
    std::filesystem::remove_all(sysfs);
}

TEST(SwitchUplinks, WhatHoldsANicIsNamed) {
    using TknCtl::Linux::Kernel::BridgeLink;
    auto link = [](int index, const char* name, const char* kind, int peer = 0) {
        BridgeLink out;
        out.index = index;
        out.name = name;
        out.kind = kind;
        out.peer = peer;
        return out;
    };
    BridgeLink nic = link(3, "eth1", "");
    BridgeLink bridge = link(7, "br1", "bridge");
    bridge.bridge = TknCtl::Linux::Kernel::BridgeInfo{};
    BridgeLink bond = link(8, "bond0", "bond");
    BridgeLink macvlan = link(9, "mv0", "macvlan", 3);
    EXPECT_EQ(NicHolder({nic, bridge, bond}, nic), "");
    nic.master = 7;
    EXPECT_EQ(NicHolder({nic, bridge, bond}, nic), "it is an uplink of virtual switch br1");
    nic.master = 8;
    EXPECT_EQ(NicHolder({nic, bridge, bond}, nic), "it is a port of bond device bond0");
    nic.master = 4;
    EXPECT_EQ(NicHolder({nic}, nic), "it is a port of device 4");
    nic.master = 0;
    EXPECT_EQ(NicHolder({nic, macvlan}, nic),
              "it carries macvlan device mv0, which takes its frames before a bridge could");
    // A macvlan of a device in another netstack is not this NIC's.
    macvlan.peerNamespaceId = 1;
    EXPECT_EQ(NicHolder({nic, macvlan}, nic), "");
}

Net::PortSecurityPolicy Security(bool promiscuous, bool macChange, bool forged) {
    Net::PortSecurityPolicy policy;
    policy.SetAllowPromiscuous(promiscuous);
    policy.SetAllowMacAddressChange(macChange);
    policy.SetAllowForgedTransmits(forged);
    return policy;
}

TEST(SecurityPolicies, EachRefusalIsAPortFlagAndPromiscuityIsRefused) {
    auto strict = SecurityFlags(Security(false, false, false));
    EXPECT_EQ(strict.flags.unicastFlood, false);
    EXPECT_EQ(strict.flags.learning, false);
    EXPECT_EQ(strict.flags.locked, true);
    EXPECT_TRUE(strict.needsClientMac);
    auto open = SecurityFlags(Security(false, true, true));
    EXPECT_EQ(open.flags.learning, true);
    EXPECT_EQ(open.flags.locked, false);
    EXPECT_FALSE(open.needsClientMac);
    // Either refusal alone needs the client's address.
    EXPECT_TRUE(SecurityFlags(Security(false, true, false)).needsClientMac);
    EXPECT_TRUE(SecurityFlags(Security(false, false, true)).needsClientMac);
    EXPECT_EQ(SecurityRefusal(Security(false, false, false)), "");
    EXPECT_NE(SecurityRefusal(Security(true, true, true)).find("promiscuous mode cannot be allowed"),
              std::string::npos);
}

Net::ShapingPolicy Shaping(std::uint64_t averageKbps, std::uint64_t peakKbps, std::uint64_t burstKib) {
    Net::ShapingPolicy policy;
    policy.SetEnabled(true);
    policy.SetAverageBps(averageKbps * 1000);
    policy.SetPeakBps(peakKbps * 1000);
    policy.SetBurstSize(burstKib * 128);
    return policy;
}

TEST(ShapingPolicies, APolicyBecomesATokenBucketOfThePort) {
    std::string why;
    auto bucket = ShapingBucket(Shaping(1000, 2000, 100), 1500, why);
    ASSERT_TRUE(bucket) << why;
    EXPECT_EQ(*bucket, (TknCtl::Linux::Kernel::TokenBucket{125000, 12800, 250000, 1518, 12800 + 6250}));
    // A peak equal to the average is no peak.
    bucket = ShapingBucket(Shaping(1000, 1000, 100), 9000, why);
    ASSERT_TRUE(bucket);
    EXPECT_EQ(bucket->peakRate, 0u);
    EXPECT_EQ(bucket->peakBucket, 0u);
}

TEST(ShapingPolicies, WhatATokenBucketCannotDoIsRefused) {
    auto refusal = [](const Net::ShapingPolicy& policy, unsigned mtu = 1500) {
        std::string why;
        EXPECT_FALSE(ShapingBucket(policy, mtu, why));
        return why;
    };
    EXPECT_EQ(
        refusal(Shaping(2000, 1000, 100)),
        "the peak bandwidth (1000 Kbps) is below the average bandwidth (2000 Kbps): a token bucket's peak "
        "rate cannot be below its average rate");
    EXPECT_EQ(refusal(Shaping(1000, 17179870, 100)),
              "a token bucket of this host takes bandwidths up to 17179869 Kbps, not 17179870 Kbps");
    EXPECT_EQ(
        refusal(Shaping(1, 1, 1000)),
        "a burst of 1000 Kib lasts 1024 seconds at the average bandwidth of 1 Kbps; a token bucket holds at "
        "most 268 seconds of it");
    EXPECT_EQ(refusal(Shaping(100000, 100000, 33554432)),
              "a token bucket holds bursts up to 33554431 Kib, not 33554432 Kib");
    EXPECT_EQ(
        refusal(Shaping(1000, 1000, 11)),
        "a burst of 1408 bytes cannot pass a full frame of 1514 bytes (MTU 1500): every such frame would be "
        "dropped");
    std::string why;
    EXPECT_TRUE(ShapingBucket(Shaping(1000, 1000, 12), 1500, why)) << why;
    EXPECT_EQ(refusal(Shaping(0, 1000, 100)), "an average bandwidth of 0 Kbps sends nothing");
    Net::ShapingPolicy partial;
    partial.SetEnabled(true);
    partial.SetAverageBps(1000);
    EXPECT_EQ(refusal(partial), "shaping needs an average bandwidth, a peak bandwidth and a burst size");
}

Net::NicTeamingPolicy Teaming(std::vector<std::string> order, int active) {
    Net::NicTeamingPolicy policy;
    policy.SetUplinkOrder(order);
    policy.SetMaxActiveUplinks(active);
    return policy;
}

TEST(TeamingPolicies, ABridgeHasOneActiveUplinkWithoutBonding) {
    EXPECT_EQ(TeamingRefusal(Net::NicTeamingPolicy(), {"eth1"}, false), "");
    EXPECT_EQ(TeamingRefusal(Teaming({"eth1"}, 1), {"eth1"}, false), "");
    EXPECT_EQ(TeamingRefusal(Teaming({}, 0), {}, false), "");
    EXPECT_EQ(
        TeamingRefusal(Teaming({"eth1"}, 0), {"eth1"}, false),
        "uplink eth1 would be standby, but a bridge forwards on every uplink it has: keeping one out of "
        "service needs the bonding driver, which this kernel does not have (CONFIG_BONDING)");
    EXPECT_NE(TeamingRefusal(Teaming({}, 0), {"eth1"}, true).find("would be unused"), std::string::npos);
    EXPECT_NE(TeamingRefusal(Teaming({}, 0), {"eth1"}, true).find("which the Linux host does not use yet"),
              std::string::npos);
    EXPECT_NE(TeamingRefusal(Net::NicTeamingPolicy(), {"eth1", "eth2"}, false).find("more than one needs"),
              std::string::npos);
    Net::NicTeamingPolicy beacon;
    Net::LinkCriteriaSelectionPolicy criteria;
    criteria.SetBeacon(false);
    beacon.SetLinkCriteria(criteria);
    EXPECT_EQ(
        TeamingRefusal(beacon, {}, false),
        "beacon probing is not available on a Linux host: a bridge knows an uplink's failure by its link "
        "state only");
}

TEST(Vlans, APortGroupsVlanAndTheUplinksTrunk) {
    using V = TknCtl::Linux::Kernel::PortVlan;
    EXPECT_EQ(PortGroupVlans(0, 1), (std::vector<V>{{1, 0, true, true}}));
    EXPECT_EQ(PortGroupVlans(10, 1), (std::vector<V>{{10, 0, true, true}}));
    EXPECT_EQ(PortGroupVlans(4095, 1), (std::vector<V>{{1, 4094, false, false}, {1, 0, true, true}}));
    EXPECT_EQ(UplinkVlans({0, 20, 10, 20, 1}, 1),
              (std::vector<V>{{10, 0, false, false}, {20, 0, false, false}, {1, 0, true, true}}));
    EXPECT_EQ(UplinkVlans({10, 4095}, 7), (std::vector<V>{{1, 4094, false, false}, {7, 0, true, true}}));
    EXPECT_EQ(UplinkVlans({}, 1), (std::vector<V>{{1, 0, true, true}}));
}

}  // namespace

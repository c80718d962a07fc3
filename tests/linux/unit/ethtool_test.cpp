// ethtool requests and replies as plain values, built and read without a kernel: the generic
// netlink messages of the ethtool family, the kernel's refusals, the ioctl's string sets, the
// bridge's VLAN counters, and what the NIC area makes of link modes, devices and pause.
#include <gtest/gtest.h>
#include <linux/ethtool.h>
#include <linux/ethtool_netlink.h>
#include <linux/if_bridge.h>
#include <linux/if_link.h>
#include <linux/netlink.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/genl/genl.h>
#include <netlink/msg.h>

#include <cerrno>
#include <cstring>
#include <memory>

#include "kernel/ethtool.h"
#include "kernel/vlan_stats.h"
#include "network/pnic.h"

namespace {

namespace K = TknCtl::Linux::Kernel;
namespace Net = HostCtl::Network;

constexpr int kFamily = 27;

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};
using Message = std::unique_ptr<nl_msg, MessageFree>;

// A reply of the ethtool family, as the kernel would send it.
Message Reply(std::uint8_t command) {
    Message message(nlmsg_alloc());
    genlmsg_put(message.get(), 0, 1, kFamily, 0, 0, command, ETHTOOL_GENL_VERSION);
    nlattr* header = nla_nest_start(message.get(), 1 | NLA_F_NESTED);
    nla_put_string(message.get(), ETHTOOL_A_HEADER_DEV_NAME, "eth0");
    nla_nest_end(message.get(), header);
    return message;
}

void PutBit(nl_msg* message, std::uint32_t index, const char* name, bool value) {
    nlattr* bit = nla_nest_start(message, ETHTOOL_A_BITSET_BITS_BIT | NLA_F_NESTED);
    nla_put_u32(message, ETHTOOL_A_BITSET_BIT_INDEX, index);
    nla_put_string(message, ETHTOOL_A_BITSET_BIT_NAME, name);
    if (value) nla_put_flag(message, ETHTOOL_A_BITSET_BIT_VALUE);
    nla_nest_end(message, bit);
}

// The top-level attributes of a request, by type.
std::map<int, nlattr*> Attributes(nl_msg* message) {
    std::map<int, nlattr*> out;
    auto* generic = static_cast<genlmsghdr*>(nlmsg_data(nlmsg_hdr(message)));
    nlattr* attr;
    int rem;
    nla_for_each_attr(attr, genlmsg_attrdata(generic, 0), genlmsg_attrlen(generic, 0), rem) {
        out[nla_type(attr)] = attr;
    }
    return out;
}

std::map<int, nlattr*> Nested(nlattr* parent) {
    std::map<int, nlattr*> out;
    nlattr* attr;
    int rem;
    nla_for_each_nested(attr, parent, rem) {
        out[nla_type(attr)] = attr;
    }
    return out;
}

TEST(EthtoolReply, ReadsScalarsAndVerboseBitsetsWithAndWithoutMask) {
    auto message = Reply(ETHTOOL_MSG_LINKMODES_GET_REPLY);
    nl_msg* m = message.get();
    nla_put_u8(m, ETHTOOL_A_LINKMODES_AUTONEG, 1);
    nla_put_u32(m, ETHTOOL_A_LINKMODES_SPEED, 1000);
    nla_put_u8(m, ETHTOOL_A_LINKMODES_DUPLEX, DUPLEX_FULL);
    nlattr* ours = nla_nest_start(m, ETHTOOL_A_LINKMODES_OURS | NLA_F_NESTED);
    nla_put_u32(m, ETHTOOL_A_BITSET_SIZE, 100);
    nlattr* bits = nla_nest_start(m, ETHTOOL_A_BITSET_BITS | NLA_F_NESTED);
    PutBit(m, 5, "1000baseT/Full", true);
    PutBit(m, 6, "Autoneg", true);
    PutBit(m, 7, "TP", false);
    PutBit(m, 40, "10000baseKR/Full", false);
    nla_nest_end(m, bits);
    nla_nest_end(m, ours);
    // The partner's modes: a list, whose bits carry no value flag but are all on.
    nlattr* peer = nla_nest_start(m, ETHTOOL_A_LINKMODES_PEER | NLA_F_NESTED);
    nla_put_flag(m, ETHTOOL_A_BITSET_NOMASK);
    bits = nla_nest_start(m, ETHTOOL_A_BITSET_BITS | NLA_F_NESTED);
    PutBit(m, 13, "Pause", false);
    nla_nest_end(m, bits);
    nla_nest_end(m, peer);

    auto reply = K::ParseEthtoolReply(m);
    ASSERT_TRUE(reply);
    EXPECT_EQ(reply->command, ETHTOOL_MSG_LINKMODES_GET_REPLY);
    EXPECT_EQ(reply->Value(ETHTOOL_A_LINKMODES_SPEED), 1000u);
    EXPECT_EQ(reply->Value(ETHTOOL_A_LINKMODES_DUPLEX), DUPLEX_FULL);
    EXPECT_FALSE(reply->Has(ETHTOOL_A_LINKMODES_LANES));
    EXPECT_EQ(reply->Value(ETHTOOL_A_LINKMODES_LANES, 7), 7u);
    const auto* set = reply->Bitset(ETHTOOL_A_LINKMODES_OURS);
    ASSERT_NE(set, nullptr);
    EXPECT_FALSE(set->list);
    EXPECT_TRUE(set->IsOn("1000baseT/Full"));
    EXPECT_TRUE(set->Has("TP"));
    EXPECT_FALSE(set->IsOn("TP"));
    EXPECT_FALSE(set->Has("Pause"));
    EXPECT_EQ(set->Word(), 0x60u);      // bits 5 and 6
    EXPECT_EQ(set->MaskWord(), 0xe0u);  // bit 40 lies beyond the first word
    EXPECT_TRUE(reply->Bitset(ETHTOOL_A_LINKMODES_PEER)->IsOn("Pause"));
    EXPECT_EQ(reply->Bitset(ETHTOOL_A_LINKMODES_PEER + 10), nullptr);
}

TEST(EthtoolReply, ReadsCompactBitsetsAndStatisticsGroups) {
    auto wol = Reply(ETHTOOL_MSG_WOL_GET_REPLY);
    nlattr* modes = nla_nest_start(wol.get(), ETHTOOL_A_WOL_MODES | NLA_F_NESTED);
    const std::uint32_t value = 0x20, mask = 0x61;
    nla_put_u32(wol.get(), ETHTOOL_A_BITSET_SIZE, 8);
    nla_put(wol.get(), ETHTOOL_A_BITSET_VALUE, 4, &value);
    nla_put(wol.get(), ETHTOOL_A_BITSET_MASK, 4, &mask);
    nla_nest_end(wol.get(), modes);
    auto reply = K::ParseEthtoolReply(wol.get());
    ASSERT_TRUE(reply);
    const auto* set = reply->Bitset(ETHTOOL_A_WOL_MODES);
    ASSERT_NE(set, nullptr);
    EXPECT_EQ(set->bits.size(), 3u);
    EXPECT_EQ(set->Word(), 0x20u);
    EXPECT_EQ(set->MaskWord(), 0x61u);

    auto stats = Reply(ETHTOOL_MSG_STATS_GET_REPLY);
    nlattr* group = nla_nest_start(stats.get(), ETHTOOL_A_STATS_GRP | NLA_F_NESTED);
    nla_put_u32(stats.get(), ETHTOOL_A_STATS_GRP_ID, ETHTOOL_STATS_ETH_MAC);
    for (auto [counter, count] : {std::pair{ETHTOOL_A_STATS_ETH_MAC_19_TX_BCAST, 7ull},
                                  std::pair{ETHTOOL_A_STATS_ETH_MAC_22_RX_BCAST, 1ull << 40}}) {
        nlattr* stat = nla_nest_start(stats.get(), ETHTOOL_A_STATS_GRP_STAT | NLA_F_NESTED);
        nla_put_u64(stats.get(), counter, count);
        nla_nest_end(stats.get(), stat);
    }
    nla_nest_end(stats.get(), group);
    reply = K::ParseEthtoolReply(stats.get());
    ASSERT_TRUE(reply);
    ASSERT_EQ(reply->statsGroups.size(), 1u);
    EXPECT_EQ(reply->statsGroups[0].id, static_cast<std::uint32_t>(ETHTOOL_STATS_ETH_MAC));
    EXPECT_EQ(reply->statsGroups[0].counters.at(ETHTOOL_A_STATS_ETH_MAC_19_TX_BCAST), 7u);
    EXPECT_EQ(reply->statsGroups[0].counters.at(ETHTOOL_A_STATS_ETH_MAC_22_RX_BCAST), 1ull << 40);

    // A message that is no generic netlink message is no reply.
    Message error(nlmsg_alloc_simple(NLMSG_ERROR, 0));
    nlmsgerr body{};
    nlmsg_append(error.get(), &body, sizeof body, NLMSG_ALIGNTO);
    EXPECT_FALSE(K::ParseEthtoolReply(error.get()));
}

TEST(EthtoolRequest, CarriesTheDeviceAndEachValueInTheWidthTheKernelExpects) {
    Message get(K::BuildEthtoolGet(kFamily, ETHTOOL_MSG_RINGS_GET, "vmnic0", ETHTOOL_FLAG_COMPACT_BITSETS));
    auto* generic = static_cast<genlmsghdr*>(nlmsg_data(nlmsg_hdr(get.get())));
    EXPECT_EQ(nlmsg_hdr(get.get())->nlmsg_type, kFamily);
    EXPECT_EQ(generic->cmd, ETHTOOL_MSG_RINGS_GET);
    auto header = Nested(Attributes(get.get()).at(ETHTOOL_A_RINGS_HEADER));
    EXPECT_STREQ(nla_get_string(header.at(ETHTOOL_A_HEADER_DEV_NAME)), "vmnic0");
    EXPECT_EQ(nla_get_u32(header.at(ETHTOOL_A_HEADER_FLAGS)),
              static_cast<std::uint32_t>(ETHTOOL_FLAG_COMPACT_BITSETS));

    Message set(
        K::BuildEthtoolSet(kFamily, ETHTOOL_MSG_COALESCE_SET, "vmnic0",
                           {{ETHTOOL_A_COALESCE_USE_ADAPTIVE_RX, 1}, {ETHTOOL_A_COALESCE_RX_USECS, 300}}));
    auto attributes = Attributes(set.get());
    EXPECT_EQ(attributes.size(), 3u);  // the header and the two values, nothing else
    EXPECT_EQ(nla_len(attributes.at(ETHTOOL_A_COALESCE_USE_ADAPTIVE_RX)), 1);
    EXPECT_EQ(nla_get_u8(attributes.at(ETHTOOL_A_COALESCE_USE_ADAPTIVE_RX)), 1);
    EXPECT_EQ(nla_get_u32(attributes.at(ETHTOOL_A_COALESCE_RX_USECS)), 300u);
    EXPECT_EQ(K::EthtoolAttributeWidth(ETHTOOL_MSG_LINKMODES_SET, ETHTOOL_A_LINKMODES_SPEED), 4);
    EXPECT_EQ(K::EthtoolAttributeWidth(ETHTOOL_MSG_LINKMODES_SET, ETHTOOL_A_LINKMODES_DUPLEX), 1);
    EXPECT_EQ(K::EthtoolAttributeWidth(ETHTOOL_MSG_RINGS_SET, ETHTOOL_A_RINGS_TX), 4);
    // A byte-wide attribute refuses what does not fit rather than sending something else.
    EXPECT_THROW(
        K::BuildEthtoolSet(kFamily, ETHTOOL_MSG_LINKINFO_SET, "vmnic0", {{ETHTOOL_A_LINKINFO_PORT, 300}}),
        HostCtl::Lib::HostCtlException);
}

TEST(EthtoolRequest, BitsetsReplaceAWordOrChangeNamedFeaturesOnly) {
    Message wol(K::BuildEthtoolBitsetSet(kFamily, ETHTOOL_MSG_WOL_SET, "vmnic0", ETHTOOL_A_WOL_MODES, 0x22));
    auto modes = Nested(Attributes(wol.get()).at(ETHTOOL_A_WOL_MODES));
    EXPECT_TRUE(modes.count(ETHTOOL_A_BITSET_NOMASK));
    EXPECT_EQ(nla_get_u32(modes.at(ETHTOOL_A_BITSET_SIZE)), 32u);
    EXPECT_EQ(nla_get_u32(modes.at(ETHTOOL_A_BITSET_VALUE)), 0x22u);

    Message features(
        K::BuildFeaturesSet(kFamily, "vmnic0", {{"rx-gro", true}, {"tx-scatter-gather", false}}));
    auto wanted = Nested(Attributes(features.get()).at(ETHTOOL_A_FEATURES_WANTED));
    EXPECT_FALSE(wanted.count(ETHTOOL_A_BITSET_NOMASK));  // a change, not a replacement
    std::vector<std::pair<std::string, bool>> bits;
    nlattr* bit;
    int rem;
    nla_for_each_nested(bit, wanted.at(ETHTOOL_A_BITSET_BITS), rem) {
        auto fields = Nested(bit);
        bits.emplace_back(nla_get_string(fields.at(ETHTOOL_A_BITSET_BIT_NAME)),
                          fields.count(ETHTOOL_A_BITSET_BIT_VALUE) != 0);
    }
    EXPECT_EQ(bits,
              (std::vector<std::pair<std::string, bool>>{{"rx-gro", true}, {"tx-scatter-gather", false}}));

    Message stats(K::BuildStatsGet(kFamily, "vmnic0", {ETHTOOL_STATS_ETH_MAC, ETHTOOL_STATS_RMON}));
    auto groups = Nested(Attributes(stats.get()).at(ETHTOOL_A_STATS_GROUPS));
    EXPECT_EQ(nla_get_u32(groups.at(ETHTOOL_A_BITSET_VALUE)),
              (1u << ETHTOOL_STATS_ETH_MAC) | (1u << ETHTOOL_STATS_RMON));
}

// An error acknowledgement: the error, the request (or only its header when capped), and the
// kernel's attributes.
Message ErrorAck(int error, const std::string& text, bool capped) {
    Message message(nlmsg_alloc_simple(NLMSG_ERROR, NLM_F_ACK_TLVS | (capped ? NLM_F_CAPPED : 0)));
    nlmsgerr body{};
    body.error = -error;
    const std::uint32_t payload = capped ? 0 : 8;
    body.msg.nlmsg_len = NLMSG_HDRLEN + payload;
    nlmsg_append(message.get(), &body, sizeof body, NLMSG_ALIGNTO);
    if (!capped) {
        char request[8] = "request";
        nlmsg_append(message.get(), request, sizeof request, NLMSG_ALIGNTO);
    }
    if (!text.empty()) nla_put_string(message.get(), NLMSGERR_ATTR_MSG, text.c_str());
    return message;
}

TEST(EthtoolRefusal, SaysWhatTheKernelSaidElseTheErrorAndWhenRootIsNeeded) {
    EXPECT_EQ(K::ParseExtackMessage(ErrorAck(EINVAL, "requested channel count exceeds maximum", true).get()),
              "requested channel count exceeds maximum");
    EXPECT_EQ(K::ParseExtackMessage(ErrorAck(EINVAL, "cannot modify an unsupported parameter", false).get()),
              "cannot modify an unsupported parameter");
    EXPECT_EQ(K::ParseExtackMessage(ErrorAck(EOPNOTSUPP, "", true).get()), "");
    EXPECT_EQ(K::RefusalText(EOPNOTSUPP, ""), "Operation not supported");
    EXPECT_EQ(K::RefusalText(EINVAL, "bad ring size"), "bad ring size");
    EXPECT_EQ(K::RefusalText(EPERM, ""), "Operation not permitted (it needs root: CAP_NET_ADMIN)");
    EXPECT_TRUE(K::EthtoolRefusal(EOPNOTSUPP, "x").Unsupported());
    EXPECT_FALSE(K::EthtoolRefusal(EINVAL, "x").Unsupported());
}

TEST(EthtoolIoctl, StringSetsAndSelfTestLines) {
    std::uint8_t data[2 * ETH_GSTRING_LEN] = {};
    std::memcpy(data, "Register test  (offline)", 24);
    std::memset(data + ETH_GSTRING_LEN, 'x', ETH_GSTRING_LEN);  // a full string has no NUL
    auto names = K::ParseStringSet(data, 2);
    EXPECT_EQ(names,
              (std::vector<std::string>{"Register test  (offline)", std::string(ETH_GSTRING_LEN, 'x')}));
    EXPECT_EQ(K::SelfTestLines({"Link test   (on/offline)  ", ""}, {0, 3, 1}),
              (std::vector<std::string>{"Link test   (on/offline): 0", "Test 2: 3", "Test 3: 1"}));
    char field[4] = {'a', 'b', 'c', 'd'};
    EXPECT_EQ(K::FixedText(field, sizeof field), "abcd");
}

TEST(BridgeVlanStats, RequestsAndRepliesOfPortCountersAndTheBridgeOption) {
    Message request(K::BuildPortVlanStatsRequest(7));
    EXPECT_EQ(nlmsg_hdr(request.get())->nlmsg_type, RTM_GETSTATS);
    auto* stats = static_cast<if_stats_msg*>(nlmsg_data(nlmsg_hdr(request.get())));
    EXPECT_EQ(stats->ifindex, 7u);
    EXPECT_EQ(stats->filter_mask,
              static_cast<std::uint32_t>(IFLA_STATS_FILTER_BIT(IFLA_STATS_LINK_XSTATS_SLAVE)));

    Message reply(nlmsg_alloc_simple(RTM_NEWSTATS, 0));
    if_stats_msg header{};
    nlmsg_append(reply.get(), &header, sizeof header, NLMSG_ALIGNTO);
    nlattr* slave = nla_nest_start(reply.get(), IFLA_STATS_LINK_XSTATS_SLAVE);
    nlattr* bridge = nla_nest_start(reply.get(), LINK_XSTATS_TYPE_BRIDGE);
    for (std::uint16_t vid : {10, 20}) {
        bridge_vlan_xstats vlan{};
        vlan.vid = vid;
        vlan.rx_packets = vid * 3u;
        vlan.tx_packets = vid * 5u;
        nla_put(reply.get(), BRIDGE_XSTATS_VLAN, sizeof vlan, &vlan);
    }
    nla_put_u32(reply.get(), BRIDGE_XSTATS_VLAN, 1);  // too short to be an entry: skipped
    nla_nest_end(reply.get(), bridge);
    nla_nest_end(reply.get(), slave);
    auto counters = K::ParsePortVlanStats(reply.get());
    ASSERT_EQ(counters.size(), 2u);
    EXPECT_EQ(counters[1].vlanId, 20);
    EXPECT_EQ(counters[1].rxPackets, 60u);
    EXPECT_EQ(counters[1].txPackets, 100u);

    Message change(K::BuildBridgeVlanStatsChange(4, true));
    EXPECT_EQ(static_cast<ifinfomsg*>(nlmsg_data(nlmsg_hdr(change.get())))->ifi_index, 4);
    nlattr* info = nlmsg_find_attr(nlmsg_hdr(change.get()), sizeof(ifinfomsg), IFLA_LINKINFO);
    ASSERT_NE(info, nullptr);
    auto data = Nested(Nested(info).at(IFLA_INFO_DATA));
    EXPECT_EQ(nla_get_u8(data.at(IFLA_BR_VLAN_STATS_ENABLED)), 1);
    EXPECT_EQ(nla_get_u8(data.at(IFLA_BR_VLAN_STATS_PER_PORT)), 1);
}

TEST(NicArea, LinkModeNamesBecomeSpeedDuplexAndMedia) {
    auto mode = TknCtl::Linux::ParseLinkModeName("1000baseT/Full");
    ASSERT_TRUE(mode);
    EXPECT_EQ(mode->speed, 1000u);
    EXPECT_EQ(mode->duplex, Net::PNIC_DUPLEX_FULL);
    EXPECT_EQ(mode->media, 2u);  // BaseT
    EXPECT_EQ(TknCtl::Linux::ParseLinkModeName("10baseT/Half")->duplex, Net::PNIC_DUPLEX_HALF);
    EXPECT_EQ(TknCtl::Linux::ParseLinkModeName("100000baseLR4_ER4/Full")->media, 21u);  // BaseLR4
    EXPECT_EQ(TknCtl::Linux::ParseLinkModeName("25000baseCR/Full")->media, 14u);        // BaseCR1
    EXPECT_EQ(TknCtl::Linux::ParseLinkModeName("200000baseDR4/Full")->media, 1u);       // Unknown
    for (const char* other :
         {"Autoneg", "TP", "Pause", "FEC_RS", "baseT/Full", "1000baseT/Quarter", "1000baseT"})
        EXPECT_FALSE(TknCtl::Linux::ParseLinkModeName(other)) << other;
}

TEST(NicArea, DevicesDescribeThemselves) {
    K::NetDevice pci;
    pci.bus = K::NetDevice::Bus::kPci;
    pci.pciAddress = "0000:04:00.0";
    pci.vendorId = "8086";
    pci.deviceId = "10d3";
    auto device = TknCtl::Linux::PciDeviceOf(pci, {"Intel Corporation", ""});
    ASSERT_TRUE(device);
    EXPECT_EQ(device->GetAddressString(), "0000:04:00.0");
    EXPECT_EQ(device->GetVendorName(), "Intel Corporation");
    EXPECT_EQ(device->GetDeviceName(), "Device 10d3");  // a model the database does not name

    K::NetDevice usb;
    usb.bus = K::NetDevice::Bus::kUsb;
    usb.vendorId = "0bda";
    usb.deviceId = "8153";
    usb.vendorName = "Real:tek";
    EXPECT_FALSE(TknCtl::Linux::PciDeviceOf(usb, {}));
    EXPECT_EQ(TknCtl::Linux::DeviceDescription(usb, ""), "USB-NIC:Real tek:8153");
    K::NetDevice platform;
    platform.subsystem = "platform";
    platform.name = "fe300000.ethernet";
    EXPECT_EQ(TknCtl::Linux::DeviceDescription(platform, ""), "platform device fe300000.ethernet");
    EXPECT_EQ(TknCtl::Linux::DeviceDescription(std::nullopt, "veth"), "virtual device (veth)");
}

TEST(NicArea, PauseResolvesAsAnnex28BSays) {
    using TknCtl::Linux::ResolvePause;
    using Both = std::pair<bool, bool>;  // (honours received pause, sends pause)
    EXPECT_EQ(ResolvePause(true, false, true, false), (Both{true, true}));
    EXPECT_EQ(ResolvePause(false, true, true, true), (Both{false, true}));
    EXPECT_EQ(ResolvePause(true, true, false, true), (Both{true, false}));
    EXPECT_EQ(ResolvePause(true, false, false, true), (Both{false, false}));
    EXPECT_EQ(ResolvePause(false, false, true, true), (Both{false, false}));
}

}  // namespace

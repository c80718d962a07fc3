// Bridges, bridge ports, VLAN filtering, forwarding entries and link addresses through
// rtnetlink, without a kernel: the requests as the kernel reads them, and replies built in
// memory as the kernel writes them (including what this machine's kernel cannot do: VLAN
// filtering).
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <linux/if_addr.h>
#include <linux/if_bridge.h>
#include <linux/if_link.h>
#include <linux/neighbour.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/msg.h>

#include <cstring>
#include <memory>

#include "hostctl/exception.h"
#include "kernel/bridges.h"

namespace {

using namespace TknCtl::Linux::Kernel;

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};
using Message = std::unique_ptr<nl_msg, MessageFree>;

Message LinkReply(int index, unsigned family = AF_UNSPEC) {
    Message message(nlmsg_alloc_simple(RTM_NEWLINK, NLM_F_MULTI));
    ifinfomsg info{};
    info.ifi_family = static_cast<unsigned char>(family);
    info.ifi_index = index;
    info.ifi_flags = 1;  // IFF_UP
    nlmsg_append(message.get(), &info, sizeof(info), NLMSG_ALIGNTO);
    return message;
}

void PutMac(nl_msg* message, int type, const unsigned char (&mac)[6]) {
    nla_put(message, type, 6, mac);
}

// The attributes of a request's header-following part, and of its nests.
struct Attrs {
    nlattr* at[64] = {};
    Attrs(nlmsghdr* header, int headerSize, int max) { nlmsg_parse(header, headerSize, at, max, nullptr); }
    Attrs(nlattr* nest, int max) { nla_parse_nested(at, max, nest, nullptr); }
};

TEST(BridgeLinks, ABridgeSaysWhetherTheKernelFiltersVlans) {
    Message filtering = LinkReply(4);
    nla_put_string(filtering.get(), IFLA_IFNAME, "br0");
    nla_put_u32(filtering.get(), IFLA_MTU, 9000);
    nlattr* info = nla_nest_start(filtering.get(), IFLA_LINKINFO);
    nla_put_string(filtering.get(), IFLA_INFO_KIND, "bridge");
    nlattr* data = nla_nest_start(filtering.get(), IFLA_INFO_DATA);
    nla_put_u8(filtering.get(), IFLA_BR_VLAN_FILTERING, 1);
    nla_put_u16(filtering.get(), IFLA_BR_VLAN_DEFAULT_PVID, 7);
    nla_put_u32(filtering.get(), IFLA_BR_STP_STATE, 1);
    nla_nest_end(filtering.get(), data);
    nla_nest_end(filtering.get(), info);
    auto link = ParseBridgeLink(filtering.get());
    ASSERT_TRUE(link);
    EXPECT_EQ(link->name, "br0");
    EXPECT_EQ(link->mtu, 9000u);
    EXPECT_TRUE(link->up);
    EXPECT_EQ(link->bridge, (BridgeInfo{true, true, 7, true}));
    EXPECT_FALSE(link->port);

    // This machine's kernel: no VLAN settings in the bridge's data at all.
    Message plain = LinkReply(5);
    info = nla_nest_start(plain.get(), IFLA_LINKINFO);
    nla_put_string(plain.get(), IFLA_INFO_KIND, "bridge");
    data = nla_nest_start(plain.get(), IFLA_INFO_DATA);
    nla_put_u8(plain.get(), IFLA_BR_VLAN_FILTERING, 0);
    nla_nest_end(plain.get(), data);
    nla_nest_end(plain.get(), info);
    EXPECT_EQ(ParseBridgeLink(plain.get())->bridge, (BridgeInfo{false, false, 0, false}));
}

TEST(BridgeLinks, APortSaysItsFlagsItsBridgeAndWhereItsPeerLies) {
    const unsigned char mac[6] = {0x02, 0xAB, 0, 0, 0, 0x01};
    Message reply = LinkReply(7);
    nla_put_string(reply.get(), IFLA_IFNAME, "vp0");
    PutMac(reply.get(), IFLA_ADDRESS, mac);
    nla_put_u32(reply.get(), IFLA_MASTER, 4);
    nla_put_u32(reply.get(), IFLA_LINK, 2);
    nla_put_s32(reply.get(), IFLA_LINK_NETNSID, 0);
    nlattr* info = nla_nest_start(reply.get(), IFLA_LINKINFO);
    nla_put_string(reply.get(), IFLA_INFO_KIND, "veth");
    nla_put_string(reply.get(), IFLA_INFO_SLAVE_KIND, "bridge");
    nlattr* data = nla_nest_start(reply.get(), IFLA_INFO_SLAVE_DATA);
    nla_put_u8(reply.get(), IFLA_BRPORT_STATE, kPortForwarding);
    nla_put_u8(reply.get(), IFLA_BRPORT_LEARNING, 0);
    nla_put_u8(reply.get(), IFLA_BRPORT_UNICAST_FLOOD, 0);
    nla_put_u8(reply.get(), IFLA_BRPORT_LOCKED, 1);
    nla_nest_end(reply.get(), data);
    nla_nest_end(reply.get(), info);
    auto link = ParseBridgeLink(reply.get());
    ASSERT_TRUE(link);
    EXPECT_EQ(link->mac, "02:ab:00:00:00:01");
    EXPECT_EQ(link->kind, "veth");
    EXPECT_EQ(link->master, 4);
    EXPECT_EQ(link->peer, 2);
    EXPECT_EQ(link->peerNamespaceId, 0);
    EXPECT_EQ(link->port, (PortInfo{kPortForwarding, false, false, false, true, true}));

    // A kernel that knows no locked ports leaves the attribute out; a device is its own link.
    Message old = LinkReply(9);
    nla_put_u32(old.get(), IFLA_LINK, 9);
    info = nla_nest_start(old.get(), IFLA_LINKINFO);
    nla_put_string(old.get(), IFLA_INFO_SLAVE_KIND, "bridge");
    nla_nest_end(old.get(), info);
    link = ParseBridgeLink(old.get());
    EXPECT_EQ(link->port, (PortInfo{kPortDisabled, true, true, false, false, false}));
    EXPECT_EQ(link->peer, 0);

    Message other(nlmsg_alloc_simple(RTM_NEWADDR, 0));
    EXPECT_FALSE(ParseBridgeLink(other.get()));
}

TEST(BridgeRequests, AddAndVlanFiltering) {
    Message add(BuildBridgeAdd("br7", 1500));
    nlmsghdr* header = nlmsg_hdr(add.get());
    EXPECT_EQ(header->nlmsg_type, RTM_NEWLINK);
    EXPECT_EQ(header->nlmsg_flags & (NLM_F_CREATE | NLM_F_EXCL), NLM_F_CREATE | NLM_F_EXCL);
    Attrs attrs(header, sizeof(ifinfomsg), IFLA_MAX);
    EXPECT_STREQ(nla_get_string(attrs.at[IFLA_IFNAME]), "br7");
    EXPECT_EQ(nla_get_u32(attrs.at[IFLA_MTU]), 1500u);
    Attrs info(attrs.at[IFLA_LINKINFO], IFLA_INFO_MAX);
    EXPECT_STREQ(nla_get_string(info.at[IFLA_INFO_KIND]), "bridge");

    Message filtering(BuildBridgeVlanFiltering(3, true));
    header = nlmsg_hdr(filtering.get());
    EXPECT_EQ(header->nlmsg_type, RTM_NEWLINK);
    EXPECT_EQ(static_cast<ifinfomsg*>(nlmsg_data(header))->ifi_index, 3);
    Attrs top(header, sizeof(ifinfomsg), IFLA_MAX);
    Attrs linkInfo(top.at[IFLA_LINKINFO], IFLA_INFO_MAX);
    EXPECT_STREQ(nla_get_string(linkInfo.at[IFLA_INFO_KIND]), "bridge");
    Attrs data(linkInfo.at[IFLA_INFO_DATA], IFLA_BR_MAX);
    EXPECT_EQ(nla_get_u8(data.at[IFLA_BR_VLAN_FILTERING]), 1);
}

TEST(BridgeRequests, PortFlagsGoNestedAsTheBridgeToolSendsThem) {
    PortFlagsChange change;
    change.learning = false;
    change.locked = true;
    Message message(BuildPortFlags(8, change));
    nlmsghdr* header = nlmsg_hdr(message.get());
    EXPECT_EQ(header->nlmsg_type, RTM_SETLINK);
    const auto* info = static_cast<ifinfomsg*>(nlmsg_data(header));
    EXPECT_EQ(info->ifi_family, AF_BRIDGE);
    EXPECT_EQ(info->ifi_index, 8);
    Attrs top(header, sizeof(ifinfomsg), IFLA_MAX);
    ASSERT_TRUE(top.at[IFLA_PROTINFO]);
    // Without the nested flag the bridge would read the attribute as a port state.
    EXPECT_TRUE(top.at[IFLA_PROTINFO]->nla_type & NLA_F_NESTED);
    Attrs flags(top.at[IFLA_PROTINFO], IFLA_BRPORT_MAX);
    EXPECT_EQ(nla_get_u8(flags.at[IFLA_BRPORT_LEARNING]), 0);
    EXPECT_EQ(nla_get_u8(flags.at[IFLA_BRPORT_LOCKED]), 1);
    EXPECT_FALSE(flags.at[IFLA_BRPORT_UNICAST_FLOOD]);  // not asked: not sent
    EXPECT_FALSE(flags.at[IFLA_BRPORT_NEIGH_SUPPRESS]);
}

TEST(BridgeRequests, PortVlansGoAsTheKernelReadsThemAndComeBackJoined) {
    std::vector<PortVlan> vlans = {{1, 4094, false, false}, {10, 0, true, true}};
    Message add(BuildPortVlans(6, vlans, true));
    nlmsghdr* header = nlmsg_hdr(add.get());
    EXPECT_EQ(header->nlmsg_type, RTM_SETLINK);
    EXPECT_EQ(static_cast<ifinfomsg*>(nlmsg_data(header))->ifi_family, AF_BRIDGE);
    Attrs top(header, sizeof(ifinfomsg), IFLA_MAX);
    ASSERT_TRUE(top.at[IFLA_AF_SPEC]);
    Attrs afSpec(top.at[IFLA_AF_SPEC], IFLA_BRIDGE_MAX);
    EXPECT_EQ(nla_get_u16(afSpec.at[IFLA_BRIDGE_FLAGS]), BRIDGE_FLAGS_MASTER);
    // Three entries: the range as its first and last VLAN, then VLAN 10.
    std::vector<bridge_vlan_info> sent;
    nlattr* entry = nullptr;
    int rest = 0;
    nla_for_each_nested(entry, top.at[IFLA_AF_SPEC], rest) {
        if (nla_type(entry) != IFLA_BRIDGE_VLAN_INFO) continue;
        bridge_vlan_info vinfo{};
        std::memcpy(&vinfo, nla_data(entry), sizeof(vinfo));
        sent.push_back(vinfo);
    }
    ASSERT_EQ(sent.size(), 3u);
    EXPECT_EQ(sent[0].flags, BRIDGE_VLAN_INFO_RANGE_BEGIN);
    EXPECT_EQ(sent[0].vid, 1);
    EXPECT_EQ(sent[1].flags, BRIDGE_VLAN_INFO_RANGE_END);
    EXPECT_EQ(sent[1].vid, 4094);
    EXPECT_EQ(sent[2].flags, BRIDGE_VLAN_INFO_PVID | BRIDGE_VLAN_INFO_UNTAGGED);
    EXPECT_EQ(sent[2].vid, 10);

    // A dump's reply has the same shape: it reads back as it was asked.
    header->nlmsg_type = RTM_NEWLINK;
    auto parsed = ParsePortVlans(add.get());
    ASSERT_TRUE(parsed);
    EXPECT_EQ(parsed->first, 6);
    EXPECT_EQ(parsed->second, vlans);

    Message remove(BuildPortVlans(6, {{5, 0, false, false}}, false));
    EXPECT_EQ(nlmsg_hdr(remove.get())->nlmsg_type, RTM_DELLINK);

    Message dump(BuildPortVlanDump());
    header = nlmsg_hdr(dump.get());
    EXPECT_EQ(header->nlmsg_type, RTM_GETLINK);
    EXPECT_TRUE(header->nlmsg_flags & NLM_F_DUMP);
    Attrs dumpAttrs(header, sizeof(ifinfomsg), IFLA_MAX);
    EXPECT_EQ(nla_get_u32(dumpAttrs.at[IFLA_EXT_MASK]), static_cast<std::uint32_t>(RTEXT_FILTER_BRVLAN));

    // An AF_UNSPEC link reply carries no VLANs.
    Message plain = LinkReply(6);
    EXPECT_FALSE(ParsePortVlans(plain.get()));
}

TEST(ForwardingEntries, AStaticEntryOfAPortComesBackAsOne) {
    Message add(BuildStaticEntry(7, "02:AB:00:00:00:09", true));
    nlmsghdr* header = nlmsg_hdr(add.get());
    EXPECT_EQ(header->nlmsg_type, RTM_NEWNEIGH);
    EXPECT_EQ(header->nlmsg_flags & (NLM_F_CREATE | NLM_F_REPLACE), NLM_F_CREATE | NLM_F_REPLACE);
    const auto* nd = static_cast<ndmsg*>(nlmsg_data(header));
    EXPECT_EQ(nd->ndm_family, AF_BRIDGE);
    EXPECT_EQ(nd->ndm_state, NUD_NOARP);
    EXPECT_EQ(ParseForwardingEntry(add.get()), (ForwardingEntry{7, "02:ab:00:00:00:09", true, false}));
    Message remove(BuildStaticEntry(7, "02:ab:00:00:00:09", false));
    EXPECT_EQ(nlmsg_hdr(remove.get())->nlmsg_type, RTM_DELNEIGH);
    EXPECT_THROW(BuildStaticEntry(7, "02:ab:00:00:00", true), HostCtl::Lib::HostCtlException);
    EXPECT_THROW(BuildStaticEntry(7, "02:ab:00:00:00:09:01", true), HostCtl::Lib::HostCtlException);

    // The entries the kernel dumps: learned ones, and a device's own lists that name no bridge.
    const unsigned char mac[6] = {0x33, 0x33, 0, 0, 0, 1};
    Message learned(nlmsg_alloc_simple(RTM_NEWNEIGH, NLM_F_MULTI));
    ndmsg entry{};
    entry.ndm_family = AF_BRIDGE;
    entry.ndm_ifindex = 5;
    entry.ndm_state = NUD_REACHABLE;
    nlmsg_append(learned.get(), &entry, sizeof(entry), NLMSG_ALIGNTO);
    PutMac(learned.get(), NDA_LLADDR, mac);
    nla_put_u32(learned.get(), NDA_MASTER, 4);
    EXPECT_EQ(ParseForwardingEntry(learned.get()), (ForwardingEntry{5, "33:33:00:00:00:01", false, false}));
    Message self(nlmsg_alloc_simple(RTM_NEWNEIGH, NLM_F_MULTI));
    entry.ndm_flags = NTF_SELF;
    entry.ndm_state = NUD_PERMANENT;
    nlmsg_append(self.get(), &entry, sizeof(entry), NLMSG_ALIGNTO);
    PutMac(self.get(), NDA_LLADDR, mac);
    EXPECT_FALSE(ParseForwardingEntry(self.get()));
}

Message AddressReply(int family, const char* text, unsigned char prefix, int index, int proto) {
    Message message(nlmsg_alloc_simple(RTM_NEWADDR, NLM_F_MULTI));
    ifaddrmsg info{};
    info.ifa_family = static_cast<unsigned char>(family);
    info.ifa_prefixlen = prefix;
    info.ifa_index = static_cast<unsigned>(index);
    nlmsg_append(message.get(), &info, sizeof(info), NLMSG_ALIGNTO);
    unsigned char bytes[16];
    inet_pton(family, text, bytes);
    nla_put(message.get(), family == AF_INET ? IFA_LOCAL : IFA_ADDRESS, family == AF_INET ? 4 : 16, bytes);
    if (proto >= 0) nla_put_u8(message.get(), IFA_PROTO, static_cast<std::uint8_t>(proto));
    return message;
}

TEST(LinkAddresses, OnlyTheKernelsOwnLinkLocalAddressesAreItsOwn) {
    auto v4 = ParseLinkAddress(AddressReply(AF_INET, "192.0.2.7", 24, 3, -1).get());
    ASSERT_TRUE(v4);
    EXPECT_EQ(v4->first, 3);
    EXPECT_EQ(v4->second, (LinkAddress{AF_INET, "192.0.2.7/24", false}));
    EXPECT_TRUE(ParseLinkAddress(AddressReply(AF_INET6, "fe80::1", 64, 3, IFAPROT_KERNEL_LL).get())
                    ->second.kernelLinkLocal);
    // A link-local address an administrator added, and one the kernel made from an
    // announcement that is no link-local at all.
    EXPECT_FALSE(ParseLinkAddress(AddressReply(AF_INET6, "fe80::1", 64, 3, IFAPROT_UNSPEC).get())
                     ->second.kernelLinkLocal);
    EXPECT_FALSE(ParseLinkAddress(AddressReply(AF_INET6, "2001:db8::1", 64, 3, IFAPROT_KERNEL_RA).get())
                     ->second.kernelLinkLocal);
    // A kernel that does not say (before 5.18): every link-local address is its own.
    auto old = ParseLinkAddress(AddressReply(AF_INET6, "fe80::2", 64, 3, -1).get());
    EXPECT_EQ(old->second, (LinkAddress{AF_INET6, "fe80::2/64", true}));
}

}  // namespace

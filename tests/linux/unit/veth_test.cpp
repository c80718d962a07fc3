// Veth pairs without a kernel: the request that makes one, as the kernel reads it, and the
// names and addresses of the bridge ends of interfaces on port groups.
#include <gtest/gtest.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <linux/veth.h>
#include <netlink/attr.h>
#include <netlink/msg.h>

#include <cstring>
#include <memory>
#include <set>

#include "hostctl/exception.h"
#include "hostctl/network/types.h"
#include "kernel/veth.h"
#include "network/tknnic.h"

namespace {

using namespace TknCtl::Linux;

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};
using Message = std::unique_ptr<nl_msg, MessageFree>;

// The attributes that follow an ifinfomsg, in a message or in a nest that starts with one (as
// VETH_INFO_PEER does).
struct Link {
    nlattr* at[IFLA_MAX + 1] = {};
    explicit Link(nlmsghdr* header) { nlmsg_parse(header, sizeof(ifinfomsg), at, IFLA_MAX, nullptr); }
    explicit Link(nlattr* peer) {
        auto* info = static_cast<char*>(nla_data(peer));
        int length = nla_len(peer) - static_cast<int>(NLMSG_ALIGN(sizeof(ifinfomsg)));
        nla_parse(at, IFLA_MAX, reinterpret_cast<nlattr*>(info + NLMSG_ALIGN(sizeof(ifinfomsg))), length,
                  nullptr);
    }
    std::string Name() const { return at[IFLA_IFNAME] ? nla_get_string(at[IFLA_IFNAME]) : ""; }
    unsigned U32(int type) const { return at[type] ? nla_get_u32(at[type]) : 0; }
    std::string Mac() const {
        if (!at[IFLA_ADDRESS] || nla_len(at[IFLA_ADDRESS]) != 6) return {};
        HostCtl::Network::MacAddress::Bytes bytes;
        std::memcpy(bytes.data(), nla_data(at[IFLA_ADDRESS]), 6);
        return HostCtl::Network::MacAddress(bytes).GetStringAddress();
    }
};

// The peer's nest of a veth request: IFLA_LINKINFO / IFLA_INFO_DATA / VETH_INFO_PEER.
nlattr* PeerOf(const Link& link, std::string& kind) {
    nlattr* info[IFLA_INFO_MAX + 1] = {};
    nla_parse_nested(info, IFLA_INFO_MAX, link.at[IFLA_LINKINFO], nullptr);
    kind = info[IFLA_INFO_KIND] ? nla_get_string(info[IFLA_INFO_KIND]) : "";
    nlattr* data[VETH_INFO_MAX + 1] = {};
    nla_parse_nested(data, VETH_INFO_MAX, info[IFLA_INFO_DATA], nullptr);
    return data[VETH_INFO_PEER];
}

TEST(VethPairs, ThePairIsOneRequestWithThePeerInItsOwnNamespace) {
    Kernel::VethPair pair;
    pair.end = {"tkn7-port", "fe:01:02:03:04:05", 1500, 0, 0};
    pair.peer = {"tkn7", "02:aa:bb:cc:dd:ee", 9000, 4, 65535};
    Message message(Kernel::BuildVethAdd(pair, 42));
    nlmsghdr* header = nlmsg_hdr(message.get());
    EXPECT_EQ(header->nlmsg_type, RTM_NEWLINK);
    EXPECT_EQ(header->nlmsg_flags & (NLM_F_CREATE | NLM_F_EXCL), NLM_F_CREATE | NLM_F_EXCL);
    const auto* info = static_cast<const ifinfomsg*>(nlmsg_data(header));
    EXPECT_EQ(info->ifi_index, 0);
    EXPECT_EQ(info->ifi_change, 0u);  // made down: a peer cannot come up as it is made

    Link end(header);
    EXPECT_EQ(end.Name(), "tkn7-port");
    EXPECT_EQ(end.Mac(), "fe:01:02:03:04:05");
    EXPECT_EQ(end.U32(IFLA_MTU), 1500u);
    EXPECT_FALSE(end.at[IFLA_NUM_RX_QUEUES]);
    EXPECT_FALSE(end.at[IFLA_NET_NS_FD]);  // the end stays where the request is sent
    std::string kind;
    nlattr* nest = PeerOf(end, kind);
    EXPECT_EQ(kind, "veth");
    ASSERT_TRUE(nest);
    Link peer(nest);
    EXPECT_EQ(peer.Name(), "tkn7");
    EXPECT_EQ(peer.Mac(), "02:aa:bb:cc:dd:ee");
    EXPECT_EQ(peer.U32(IFLA_MTU), 9000u);
    EXPECT_EQ(peer.U32(IFLA_NUM_RX_QUEUES), 4u);
    EXPECT_EQ(peer.U32(IFLA_GSO_MAX_SIZE), 65535u);
    EXPECT_EQ(peer.U32(IFLA_NET_NS_FD), 42u);
}

TEST(VethPairs, WhatIsLeftUnsetIsTheKernelsAndAMalformedAddressIsRefused) {
    Kernel::VethPair pair;
    pair.end.name = "a0";
    pair.peer.name = "a1";
    Message message(Kernel::BuildVethAdd(pair, -1));
    Link end(nlmsg_hdr(message.get()));
    std::string kind;
    Link peer(PeerOf(end, kind));
    EXPECT_EQ(peer.Name(), "a1");
    for (int type : {IFLA_ADDRESS, IFLA_MTU, IFLA_NUM_RX_QUEUES, IFLA_GSO_MAX_SIZE, IFLA_NET_NS_FD}) {
        EXPECT_FALSE(end.at[type]) << type;
        EXPECT_FALSE(peer.at[type]) << type;
    }
    pair.peer.mac = "02:aa:bb:cc:dd";
    try {
        Message never(Kernel::BuildVethAdd(pair, -1));
        FAIL() << "a malformed MAC address was taken";
    } catch (const HostCtl::Lib::HostCtlException& e) {
        EXPECT_EQ(std::string(e.what()), "Invalid MAC address 02:aa:bb:cc:dd");
    }
}

TEST(BridgeEnds, AreNamedAfterTheirInterfaceAndNeverTakeTheBridgesAddress) {
    EXPECT_EQ(BridgeEndName("tkn0"), "tkn0-port");
    EXPECT_LE(BridgeEndName("tkn255").size(), 15u);  // IFNAMSIZ - 1
    EXPECT_EQ(InterfaceOfBridgeEnd("tkn0-port"), "tkn0");
    EXPECT_EQ(InterfaceOfBridgeEnd("tkn255-port"), "tkn255");
    for (const char* other : {"tkn0", "vp0", "tkn256-port", "tkn01-port", "-port", "tkn0-portx", "e1-port"})
        EXPECT_FALSE(InterfaceOfBridgeEnd(other)) << other;

    const std::string mac = BridgeEndMac({0x01, 0x02, 0x03, 0x04, 0xff});
    EXPECT_EQ(mac, "fe:01:02:03:04:ff");
    HostCtl::Network::MacAddress parsed(mac);
    EXPECT_TRUE(parsed.IsUnicast());
    EXPECT_TRUE(parsed.GetBytes()[0] & 0x02);  // locally administered
}

TEST(BridgeEnds, TheLowestFreeNameIsTakenAndNoneIsLeftOnceAllAre) {
    std::set<std::string> taken{"tkn0", "tkn1", "tkn3"};
    EXPECT_EQ(FreeInterfaceName([&](const std::string& name) { return taken.count(name) > 0; }), "tkn2");
    try {
        FreeInterfaceName([](const std::string&) { return true; });
        FAIL() << "a name was found where none is free";
    } catch (const HostCtl::Lib::HostCtlException& e) {
        EXPECT_EQ(std::string(e.what()),
                  "No free Tarkon network interface name: tkn0 to tkn255 are all in use");
    }
}

}  // namespace

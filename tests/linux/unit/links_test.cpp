// Devices as rtnetlink reports them, which of them are IP interfaces, and the kernel's answers
// to requests: messages built in memory.
#include <gtest/gtest.h>
#include <linux/if.h>
#include <linux/if_link.h>
#include <linux/ipv6.h>
#include <linux/netlink.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstring>
#include <memory>
#include <vector>

#include "kernel/links.h"
#include "kernel/request.h"
#include "network/kernel_view.h"

namespace {

namespace Kernel = TknCtl::Linux::Kernel;

using Message = std::unique_ptr<nl_msg, void (*)(nl_msg*)>;

Message LinkMessage(int index, const char* name, const std::vector<std::int32_t>& ipv6Conf) {
    Message message(nlmsg_alloc_simple(RTM_NEWLINK, 0), nlmsg_free);
    nlmsg_set_proto(message.get(), NETLINK_ROUTE);
    ifinfomsg info{};
    info.ifi_family = AF_UNSPEC;
    info.ifi_index = index;
    info.ifi_flags = IFF_UP | IFF_BROADCAST;
    nlmsg_append(message.get(), &info, sizeof(info), NLMSG_ALIGNTO);
    nla_put_string(message.get(), IFLA_IFNAME, name);
    nla_put_u32(message.get(), IFLA_MTU, 9000);
    nla_put_u32(message.get(), IFLA_GSO_MAX_SIZE, 65536);
    nla_put_u32(message.get(), IFLA_NUM_RX_QUEUES, 4);
    nla_put_u32(message.get(), IFLA_MASTER, 2);
    nla_put_u8(message.get(), IFLA_OPERSTATE, 6);  // IF_OPER_UP
    unsigned char mac[6] = {0x02, 0xab, 0x00, 0x00, 0x00, 0x0f};
    nla_put(message.get(), IFLA_ADDRESS, 6, mac);
    nlattr* linkinfo = nla_nest_start(message.get(), IFLA_LINKINFO);
    nla_put_string(message.get(), IFLA_INFO_KIND, "veth");
    nla_nest_end(message.get(), linkinfo);
    rtnl_link_stats64 stats{};
    stats.rx_packets = 11;
    stats.tx_window_errors = 3;
    nla_put(message.get(), IFLA_STATS64, sizeof(stats), &stats);
    if (!ipv6Conf.empty()) {
        nlattr* spec = nla_nest_start(message.get(), IFLA_AF_SPEC);
        nlattr* inet6 = nla_nest_start(message.get(), AF_INET6);
        nla_put(message.get(), IFLA_INET6_CONF, static_cast<int>(ipv6Conf.size() * sizeof(std::int32_t)),
                ipv6Conf.data());
        nla_nest_end(message.get(), inet6);
        nla_nest_end(message.get(), spec);
    }
    return message;
}

std::vector<std::int32_t> Ipv6Conf(int forwarding, int acceptRa, int disabled) {
    std::vector<std::int32_t> conf(DEVCONF_MAX, 0);
    conf[DEVCONF_FORWARDING] = forwarding;
    conf[DEVCONF_ACCEPT_RA] = acceptRa;
    conf[DEVCONF_DISABLE_IPV6] = disabled;
    return conf;
}

TEST(Links, ADeviceReadsWithItsOffloadQueuesAndIpv6Settings) {
    auto link = Kernel::ParseLink(LinkMessage(7, "eth3", Ipv6Conf(0, 1, 0)).get());
    ASSERT_TRUE(link);
    EXPECT_EQ(link->index, 7);
    EXPECT_EQ(link->name, "eth3");
    EXPECT_EQ(link->mtu, 9000u);
    EXPECT_EQ(link->gsoMaxSize, 65536u);
    EXPECT_EQ(link->numRxQueues, 4u);
    EXPECT_TRUE(link->up);
    EXPECT_EQ(link->kind, "veth");
    EXPECT_EQ(link->mac, "02:ab:00:00:00:0f");
    EXPECT_EQ(link->master, 2);
    EXPECT_EQ(link->operState, "up");
    EXPECT_EQ(link->stats.rxPackets, 11u);
    EXPECT_EQ(link->stats.txWindowErrors, 3u);
    ASSERT_TRUE(link->ipv6);
    EXPECT_FALSE(link->ipv6->disabled);
    EXPECT_TRUE(link->ipv6->AcceptsRouterAdvertisements());

    // accept_ra 1 yields to forwarding; 2 does not; 0 never accepts.
    EXPECT_FALSE(Kernel::ParseLink(LinkMessage(7, "eth3", Ipv6Conf(1, 1, 0)).get())
                     ->ipv6->AcceptsRouterAdvertisements());
    EXPECT_TRUE(Kernel::ParseLink(LinkMessage(7, "eth3", Ipv6Conf(1, 2, 0)).get())
                    ->ipv6->AcceptsRouterAdvertisements());
    EXPECT_FALSE(Kernel::ParseLink(LinkMessage(7, "eth3", Ipv6Conf(0, 0, 1)).get())
                     ->ipv6->AcceptsRouterAdvertisements());
    EXPECT_TRUE(Kernel::ParseLink(LinkMessage(7, "eth3", Ipv6Conf(0, 0, 1)).get())->ipv6->disabled);
    // A device without IPv6 state, and a short settings array (an older kernel's).
    EXPECT_FALSE(Kernel::ParseLink(LinkMessage(7, "eth3", {}).get())->ipv6);
    auto shortConf = Kernel::ParseLink(LinkMessage(7, "eth3", {0, 0, 0, 2}).get());
    ASSERT_TRUE(shortConf->ipv6);
    EXPECT_EQ(shortConf->ipv6->acceptRa, 2);
    EXPECT_FALSE(shortConf->ipv6->disabled);
}

TEST(Links, BridgePortsAndTheLoopbackAreNoIpInterfaces) {
    auto make = [](int index, const char* name, const char* kind, int master) {
        Kernel::Link link;
        link.index = index;
        link.name = name;
        link.kind = kind;
        link.master = master;
        return link;
    };
    std::vector<Kernel::Link> links = {make(1, "lo", "", 0),     make(2, "br0", "bridge", 0),
                                       make(3, "p0", "veth", 2), make(4, "vrf0", "vrf", 0),
                                       make(5, "v0", "veth", 4), make(6, "bond0", "bond", 0),
                                       make(7, "s0", "", 6),     make(8, "orphan", "veth", 99)};
    links[0].loopback = true;
    std::vector<std::string> ip;
    for (const auto& link : links) {
        if (TknCtl::Linux::IsIpInterface(link, links)) ip.push_back(link.name);
    }
    EXPECT_EQ(ip, (std::vector<std::string>{"br0", "vrf0", "v0", "bond0", "orphan"}));
}

// An NLMSG_ERROR message as the kernel sends it: the error, the request echoed (whole, or its
// header when capped), then the extended attributes.
std::vector<char> ErrorMessage(int error, bool capped, const char* reason) {
    nlmsghdr request{};
    request.nlmsg_len = NLMSG_LENGTH(12);
    request.nlmsg_type = RTM_NEWROUTE;
    std::vector<char> bytes(NLMSG_HDRLEN + sizeof(nlmsgerr) + (capped ? 0 : 12));
    auto* header = reinterpret_cast<nlmsghdr*>(bytes.data());
    header->nlmsg_type = NLMSG_ERROR;
    header->nlmsg_flags = (capped ? NLM_F_CAPPED : 0) | (reason ? NLM_F_ACK_TLVS : 0);
    auto* payload = reinterpret_cast<nlmsgerr*>(bytes.data() + NLMSG_HDRLEN);
    payload->error = error;
    payload->msg = request;
    if (reason) {
        std::size_t length = std::strlen(reason) + 1;
        nlattr attr{};
        attr.nla_len = static_cast<unsigned short>(NLA_HDRLEN + length);
        attr.nla_type = NLMSGERR_ATTR_MSG;
        std::size_t at = NLMSG_ALIGN(bytes.size());
        bytes.resize(at + NLA_ALIGN(attr.nla_len));
        std::memcpy(bytes.data() + at, &attr, sizeof(attr));
        std::memcpy(bytes.data() + at + NLA_HDRLEN, reason, length);
    }
    reinterpret_cast<nlmsghdr*>(bytes.data())->nlmsg_len = static_cast<unsigned>(bytes.size());
    return bytes;
}

TEST(KernelAnswers, TheKernelsReasonIsReadWhetherTheRequestIsEchoedOrNot) {
    for (bool capped : {false, true}) {
        auto bytes = ErrorMessage(-ENETUNREACH, capped, "Nexthop has invalid gateway");
        auto answer = Kernel::ParseAnswer(reinterpret_cast<const nlmsghdr*>(bytes.data()));
        EXPECT_EQ(answer.error, -ENETUNREACH);
        EXPECT_EQ(answer.reason, "Nexthop has invalid gateway");
        EXPECT_EQ(Kernel::RefusalText(answer), "Nexthop has invalid gateway");
    }
    // Without a reason the text of the error number serves; an acknowledgement is error 0.
    auto plain = ErrorMessage(-EEXIST, false, nullptr);
    auto answer = Kernel::ParseAnswer(reinterpret_cast<const nlmsghdr*>(plain.data()));
    EXPECT_TRUE(answer.reason.empty());
    EXPECT_EQ(Kernel::RefusalText(answer), "File exists");
    auto ack = ErrorMessage(0, true, nullptr);
    EXPECT_EQ(Kernel::ParseAnswer(reinterpret_cast<const nlmsghdr*>(ack.data())).error, 0);
    // A truncated message is no answer to trust.
    nlmsghdr truncated{};
    truncated.nlmsg_len = NLMSG_HDRLEN;
    truncated.nlmsg_type = NLMSG_ERROR;
    EXPECT_EQ(Kernel::ParseAnswer(&truncated).error, -EBADMSG);
}

}  // namespace

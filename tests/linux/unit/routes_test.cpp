// Routes as rtnetlink reports them and the requests that add and delete them: messages built in
// memory.
#include <gtest/gtest.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <sys/socket.h>

#include <cstring>
#include <memory>

#include "hostctl/exception.h"
#include "kernel/request.h"
#include "kernel/routes.h"

namespace {

namespace Kernel = TknCtl::Linux::Kernel;

using Message = std::unique_ptr<nl_msg, void (*)(nl_msg*)>;

Message RouteMessage(int family, unsigned prefix, const char* destination, unsigned flags = 0) {
    Message message(nlmsg_alloc_simple(RTM_NEWROUTE, 0), nlmsg_free);
    rtmsg info{};
    info.rtm_family = static_cast<unsigned char>(family);
    info.rtm_dst_len = static_cast<unsigned char>(prefix);
    info.rtm_table = RT_TABLE_MAIN;
    info.rtm_protocol = RTPROT_STATIC;
    info.rtm_type = RTN_UNICAST;
    info.rtm_flags = flags;
    nlmsg_append(message.get(), &info, sizeof(info), NLMSG_ALIGNTO);
    unsigned char bytes[16];
    if (destination && Kernel::AddressBytes(family, destination, bytes))
        nla_put(message.get(), RTA_DST, family == AF_INET ? 4 : 16, bytes);
    return message;
}

void PutAddress(nl_msg* message, int type, int family, const char* text) {
    unsigned char bytes[16];
    ASSERT_TRUE(Kernel::AddressBytes(family, text, bytes));
    nla_put(message, type, family == AF_INET ? 4 : 16, bytes);
}

TEST(Routes, ARouteReadsWithItsNextHopTableAndMetric) {
    auto message = RouteMessage(AF_INET, 16, "10.2.0.0");
    PutAddress(message.get(), RTA_GATEWAY, AF_INET, "10.1.0.2");
    nla_put_u32(message.get(), RTA_OIF, 3);
    nla_put_u32(message.get(), RTA_PRIORITY, 100);
    nla_put_u32(message.get(), RTA_TABLE, 1000);  // beyond the 8 bits of rtm_table
    PutAddress(message.get(), RTA_PREFSRC, AF_INET, "10.1.0.1");
    auto route = Kernel::ParseRoute(nlmsg_hdr(message.get()));
    ASSERT_TRUE(route);
    EXPECT_EQ(route->destination, "10.2.0.0");
    EXPECT_EQ(route->prefixLength, 16u);
    EXPECT_EQ(route->table, 1000u);
    EXPECT_EQ(route->protocol, static_cast<unsigned>(RTPROT_STATIC));
    EXPECT_EQ(route->metric, 100u);
    EXPECT_EQ(route->preferredSource, "10.1.0.1");
    ASSERT_EQ(route->nexthops.size(), 1u);
    EXPECT_EQ(route->nexthops[0], (Kernel::Nexthop{"10.1.0.2", 3}));
    EXPECT_EQ(Kernel::DescribeRoute(*route), "10.2.0.0/16 via 10.1.0.2");

    // The default route has no destination attribute; a route of the kernel's cache is left out.
    auto fallback = Kernel::ParseRoute(nlmsg_hdr(RouteMessage(AF_INET6, 0, nullptr).get()));
    ASSERT_TRUE(fallback);
    EXPECT_EQ(fallback->destination, "::");
    EXPECT_TRUE(fallback->IsDefault());
    EXPECT_TRUE(fallback->nexthops.empty());
    EXPECT_EQ(Kernel::DescribeRoute(*fallback), "default");
    EXPECT_FALSE(Kernel::ParseRoute(nlmsg_hdr(RouteMessage(AF_INET, 32, "10.2.0.9", RTM_F_CLONED).get())));
    EXPECT_FALSE(Kernel::ParseRoute(nlmsg_hdr(RouteMessage(AF_BRIDGE, 0, nullptr).get())));
}

TEST(Routes, AMultipathRouteReadsOneNextHopEach) {
    auto message = RouteMessage(AF_INET6, 0, nullptr);
    // Two rtnexthop entries, each followed by its RTA_GATEWAY.
    char buffer[2 * (sizeof(rtnexthop) + RTA_SPACE(16))] = {};
    char* at = buffer;
    int index = 5;
    for (const char* gateway : {"fe80::1", "fe80::2"}) {
        auto* hop = reinterpret_cast<rtnexthop*>(at);
        hop->rtnh_len = static_cast<unsigned short>(sizeof(rtnexthop) + RTA_SPACE(16));
        hop->rtnh_ifindex = index++;
        auto* attr = reinterpret_cast<rtattr*>(at + sizeof(rtnexthop));
        attr->rta_len = RTA_LENGTH(16);
        attr->rta_type = RTA_GATEWAY;
        unsigned char bytes[16];
        ASSERT_TRUE(Kernel::AddressBytes(AF_INET6, gateway, bytes));
        std::memcpy(RTA_DATA(attr), bytes, 16);
        at += hop->rtnh_len;
    }
    nla_put(message.get(), RTA_MULTIPATH, static_cast<int>(at - buffer), buffer);
    auto route = Kernel::ParseRoute(nlmsg_hdr(message.get()));
    ASSERT_TRUE(route);
    EXPECT_EQ(route->nexthops, (std::vector<Kernel::Nexthop>{{"fe80::1", 5}, {"fe80::2", 6}}));
}

TEST(Routes, AnAddIsExclusiveAndADeleteMatchesAnyScope) {
    Kernel::Route route;
    route.family = AF_INET6;
    route.destination = "2001:db8:5::";
    route.prefixLength = 48;
    route.protocol = RTPROT_STATIC;
    route.nexthops.push_back({"2001:db8::2", 3});
    Message add(Kernel::BuildRouteRequest(RTM_NEWROUTE, route), nlmsg_free);
    nlmsghdr* header = nlmsg_hdr(add.get());
    EXPECT_EQ(header->nlmsg_flags & (NLM_F_CREATE | NLM_F_EXCL), NLM_F_CREATE | NLM_F_EXCL);
    // What is built reads back as it was meant (a new route as RTM_NEWROUTE).
    auto back = Kernel::ParseRoute(nlmsg_hdr(add.get()));
    ASSERT_TRUE(back);
    EXPECT_EQ(back->destination, "2001:db8:5::");
    EXPECT_EQ(back->prefixLength, 48u);
    EXPECT_EQ(back->table, Kernel::kMainTable);
    EXPECT_EQ(back->nexthops, route.nexthops);
    EXPECT_EQ(back->metric, 0u);  // the kernel's default metric

    route.metric = 1024;
    Message remove(Kernel::BuildRouteRequest(RTM_DELROUTE, route), nlmsg_free);
    header = nlmsg_hdr(remove.get());
    EXPECT_EQ(header->nlmsg_type, RTM_DELROUTE);
    EXPECT_EQ(static_cast<const rtmsg*>(nlmsg_data(header))->rtm_scope, RT_SCOPE_NOWHERE);
    nlattr* tb[RTA_MAX + 1] = {};
    ASSERT_EQ(nlmsg_parse(header, sizeof(rtmsg), tb, RTA_MAX, nullptr), 0);
    ASSERT_TRUE(tb[RTA_PRIORITY]);
    EXPECT_EQ(nla_get_u32(tb[RTA_PRIORITY]), 1024u);

    // A default route carries no destination; what cannot be expressed is refused.
    route.destination = "::";
    route.prefixLength = 0;
    Message fallback(Kernel::BuildRouteRequest(RTM_NEWROUTE, route), nlmsg_free);
    nlattr* dt[RTA_MAX + 1] = {};
    ASSERT_EQ(nlmsg_parse(nlmsg_hdr(fallback.get()), sizeof(rtmsg), dt, RTA_MAX, nullptr), 0);
    EXPECT_FALSE(dt[RTA_DST]);
    route.nexthops.push_back({"2001:db8::3", 3});
    EXPECT_THROW(Kernel::BuildRouteRequest(RTM_NEWROUTE, route), HostCtl::Lib::HostCtlException);
    route.nexthops.pop_back();
    route.nexthops[0].gateway = "10.0.0.1";
    EXPECT_THROW(Kernel::BuildRouteRequest(RTM_NEWROUTE, route), HostCtl::Lib::HostCtlException);
    route.family = AF_PACKET;
    EXPECT_THROW(Kernel::BuildRouteRequest(RTM_NEWROUTE, route), HostCtl::Lib::HostCtlException);
}

}  // namespace

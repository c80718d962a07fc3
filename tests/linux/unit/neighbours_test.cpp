// Neighbour entries and table timings as rtnetlink reports them, what the library makes of them
// (state, type, expiry), the request that deletes an entry, and the multicast memberships of
// /proc/net/igmp and igmp6.
#include <gtest/gtest.h>
#include <linux/neighbour.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <memory>

#include "hostctl/exception.h"
#include "kernel/multicast.h"
#include "kernel/neighbours.h"
#include "kernel/request.h"
#include "network/kernel_view.h"

namespace {

namespace Kernel = TknCtl::Linux::Kernel;

using Message = std::unique_ptr<nl_msg, void (*)(nl_msg*)>;

Message NeighbourMessage(int family, const char* address, std::uint16_t state, std::uint8_t flags) {
    Message message(nlmsg_alloc_simple(RTM_NEWNEIGH, 0), nlmsg_free);
    ndmsg info{};
    info.ndm_family = static_cast<unsigned char>(family);
    info.ndm_ifindex = 3;
    info.ndm_state = state;
    info.ndm_flags = flags;
    nlmsg_append(message.get(), &info, sizeof(info), NLMSG_ALIGNTO);
    unsigned char bytes[16];
    if (address && Kernel::AddressBytes(family, address, bytes))
        nla_put(message.get(), NDA_DST, family == AF_INET ? 4 : 16, bytes);
    return message;
}

TEST(Neighbours, AnEntryReadsWithItsLinkLayerAddressAndAgesInSeconds) {
    auto message = NeighbourMessage(AF_INET6, "fe80::1", NUD_REACHABLE, NTF_ROUTER);
    unsigned char mac[6] = {0x02, 0x1c, 0x73, 0x00, 0x00, 0x0a};
    nla_put(message.get(), NDA_LLADDR, 6, mac);
    long tick = sysconf(_SC_CLK_TCK);
    nda_cacheinfo cache{};
    cache.ndm_confirmed = static_cast<std::uint32_t>(12 * tick);
    cache.ndm_used = static_cast<std::uint32_t>(3 * tick + tick / 2);
    cache.ndm_updated = static_cast<std::uint32_t>(40 * tick);
    nla_put(message.get(), NDA_CACHEINFO, sizeof(cache), &cache);
    auto entry = Kernel::ParseNeighbour(nlmsg_hdr(message.get()));
    ASSERT_TRUE(entry);
    EXPECT_EQ(entry->address, "fe80::1");
    EXPECT_EQ(entry->index, 3);
    EXPECT_EQ(entry->linkLayer, "02:1c:73:00:00:0a");
    EXPECT_EQ(entry->confirmedAge, 12u);
    EXPECT_EQ(entry->usedAge, 3u);
    EXPECT_EQ(entry->updatedAge, 40u);
    EXPECT_EQ(TknCtl::Linux::NeighbourType(*entry), "Router");

    // An unresolved entry has no link-layer address; the bridge's forwarding entries (AF_BRIDGE)
    // and entries without an address are none of the tables'.
    auto unresolved =
        Kernel::ParseNeighbour(nlmsg_hdr(NeighbourMessage(AF_INET, "10.1.0.9", NUD_INCOMPLETE, 0).get()));
    ASSERT_TRUE(unresolved);
    EXPECT_EQ(unresolved->linkLayer, "");
    EXPECT_EQ(TknCtl::Linux::NeighbourType(*unresolved), "Dynamic");
    EXPECT_FALSE(
        Kernel::ParseNeighbour(nlmsg_hdr(NeighbourMessage(AF_BRIDGE, nullptr, NUD_PERMANENT, 0).get())));
    EXPECT_FALSE(
        Kernel::ParseNeighbour(nlmsg_hdr(NeighbourMessage(AF_INET, nullptr, NUD_PERMANENT, 0).get())));
}

TEST(Neighbours, StateTypeAndExpiryFollowTheKernelsStateAndTimings) {
    using TknCtl::Linux::NeighbourExpiry;
    using TknCtl::Linux::NeighbourState;
    using TknCtl::Linux::NeighbourType;
    // A state the kernel may combine with others reads as the one that matters.
    EXPECT_EQ(NeighbourState(NUD_STALE), 2u);
    EXPECT_EQ(NeighbourState(NUD_PERMANENT | NUD_NOARP), 6u);
    EXPECT_EQ(NeighbourState(NUD_NONE), 8u);

    Kernel::Neighbour entry;
    entry.confirmedAge = 10;
    entry.usedAge = 20;
    entry.updatedAge = 2;
    Kernel::NeighbourTiming timing;
    timing.reachableTime = 25500;
    timing.gcStaleTime = 60000;
    timing.delayProbeTime = 5000;
    entry.state = NUD_REACHABLE;
    EXPECT_EQ(NeighbourExpiry(entry, timing), 15u);
    entry.state = NUD_STALE;
    EXPECT_EQ(NeighbourExpiry(entry, timing), 40u);
    entry.state = NUD_DELAY;
    EXPECT_EQ(NeighbourExpiry(entry, timing), 3u);
    entry.confirmedAge = 90;
    entry.state = NUD_REACHABLE;
    EXPECT_EQ(NeighbourExpiry(entry, timing), 0u);  // overdue, not negative
    entry.state = NUD_PERMANENT;
    EXPECT_EQ(NeighbourExpiry(entry, timing), 0u);
    EXPECT_EQ(NeighbourType(entry), "Static");
    entry.state = NUD_NOARP;
    entry.flags = NTF_ROUTER;
    EXPECT_EQ(NeighbourType(entry), "Static");
}

TEST(Neighbours, TimingsAreReadPerDeviceAndADeleteNamesTheEntry) {
    Message message(nlmsg_alloc_simple(RTM_NEWNEIGHTBL, 0), nlmsg_free);
    ndtmsg info{};
    info.ndtm_family = AF_INET6;
    nlmsg_append(message.get(), &info, sizeof(info), NLMSG_ALIGNTO);
    nla_put_string(message.get(), NDTA_NAME, "ndisc_cache");
    nlattr* parms = nla_nest_start(message.get(), NDTA_PARMS);
    nla_put_u32(message.get(), NDTPA_IFINDEX, 3);
    nla_put_u64(message.get(), NDTPA_REACHABLE_TIME, 31000);
    nla_put_u64(message.get(), NDTPA_GC_STALETIME, 60000);
    nla_put_u64(message.get(), NDTPA_DELAY_PROBE_TIME, 5000);
    nla_nest_end(message.get(), parms);
    auto timing = Kernel::ParseNeighbourTiming(nlmsg_hdr(message.get()));
    ASSERT_TRUE(timing);
    EXPECT_EQ(timing->family, AF_INET6);
    EXPECT_EQ(timing->index, 3);
    EXPECT_EQ(timing->reachableTime, 31000u);
    EXPECT_EQ(timing->gcStaleTime, 60000u);
    EXPECT_EQ(timing->delayProbeTime, 5000u);

    Kernel::Neighbour entry;
    entry.family = AF_INET;
    entry.index = 3;
    entry.address = "10.1.0.9";
    Message remove(Kernel::BuildNeighbourDelete(entry), nlmsg_free);
    nlmsghdr* header = nlmsg_hdr(remove.get());
    EXPECT_EQ(header->nlmsg_type, RTM_DELNEIGH);
    EXPECT_EQ(static_cast<const ndmsg*>(nlmsg_data(header))->ndm_ifindex, 3);
    nlattr* tb[NDA_MAX + 1] = {};
    ASSERT_EQ(nlmsg_parse(header, sizeof(ndmsg), tb, NDA_MAX, nullptr), 0);
    ASSERT_TRUE(tb[NDA_DST]);
    EXPECT_EQ(nla_len(tb[NDA_DST]), 4);
    entry.address = "fe80::1";
    EXPECT_THROW(Kernel::BuildNeighbourDelete(entry), HostCtl::Lib::HostCtlException);
}

TEST(Multicast, MembershipsAreReadFromTheKernelsTablesAndSkipWhatIsMalformed) {
    // As this machine's kernel prints them (224.0.0.1 is 010000E0 on a little-endian machine).
    std::uint32_t group = 0;
    unsigned char bytes[4] = {224, 0, 0, 251};
    std::memcpy(&group, bytes, 4);
    char line[64];
    std::snprintf(line, sizeof(line), "\t\t\t\t%08X     2 0:00000000\t\t0\n", group);
    std::string igmp = std::string("Idx\tDevice    : Count Querier\tGroup    Users Timer\tReporter\n") +
                       "1\tlo        :     1      V3\n\t\t\t\t010000E0     1 0:00000000\t\t0\n" +
                       "3\teth0      :     2      V3\n" + line + "\t\t\t\tZZZZ     1 0:00000000\t\t0\n";
    auto ipv4 = Kernel::ParseIgmp(igmp);
    ASSERT_EQ(ipv4.size(), 2u);
    EXPECT_EQ(ipv4[0].device, "lo");
    EXPECT_EQ(ipv4[1].index, 3);
    EXPECT_EQ(ipv4[1].device, "eth0");
    EXPECT_EQ(ipv4[1].group, "224.0.0.251");
    EXPECT_EQ(ipv4[1].users, 2u);

    auto ipv6 = Kernel::ParseIgmp6(
        "3    eth0            ff0200000000000000000001ff000010     2 00000004 0\n"
        "3    eth0            ff02::1     1 0000000C 0\n"
        "x    eth0            ff020000000000000000000000000001     1 0000000C 0\n");
    ASSERT_EQ(ipv6.size(), 1u);
    EXPECT_EQ(ipv6[0].group, "ff02::1:ff00:10");
    EXPECT_EQ(ipv6[0].users, 2u);

    EXPECT_EQ(Kernel::EthernetGroupAddress("224.129.0.251"), "01:00:5e:01:00:fb");  // the low 23 bits
    EXPECT_EQ(Kernel::EthernetGroupAddress("ff02::1:ff00:10"), "33:33:ff:00:00:10");
    EXPECT_EQ(Kernel::EthernetGroupAddress("10.0.0.1"), "");
    EXPECT_EQ(Kernel::EthernetGroupAddress("2001:db8::1"), "");
    EXPECT_EQ(Kernel::EthernetGroupAddress("nonsense"), "");
}

}  // namespace

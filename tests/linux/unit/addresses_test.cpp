// Addresses as rtnetlink reports them, the requests that add and delete them, and what an
// address is to the library (its origin and state): messages built in memory.
#include <gtest/gtest.h>
#include <linux/if_addr.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <sys/socket.h>

#include <memory>

#include "hostctl/exception.h"
#include "hostctl/network/types.h"
#include "kernel/addresses.h"
#include "kernel/request.h"
#include "network/kernel_view.h"

namespace {

namespace Kernel = TknCtl::Linux::Kernel;
using HostCtl::Network::Ipv6Network;

using Message = std::unique_ptr<nl_msg, void (*)(nl_msg*)>;

Message AddressMessage(int family, unsigned prefix, std::uint32_t flags, const char* local,
                       const char* remote) {
    Message message(nlmsg_alloc_simple(RTM_NEWADDR, 0), nlmsg_free);
    ifaddrmsg info{};
    info.ifa_family = static_cast<unsigned char>(family);
    info.ifa_prefixlen = static_cast<unsigned char>(prefix);
    info.ifa_index = 4;
    info.ifa_flags = static_cast<unsigned char>(flags);
    nlmsg_append(message.get(), &info, sizeof(info), NLMSG_ALIGNTO);
    unsigned char bytes[16];
    int length = family == AF_INET ? 4 : 16;
    if (local && Kernel::AddressBytes(family, local, bytes)) nla_put(message.get(), IFA_LOCAL, length, bytes);
    if (remote && Kernel::AddressBytes(family, remote, bytes))
        nla_put(message.get(), IFA_ADDRESS, length, bytes);
    nla_put_u32(message.get(), IFA_FLAGS, flags);
    return message;
}

TEST(Addresses, AnIpv4AddressReadsWithItsBroadcastLabelAndLifetimes) {
    auto message = AddressMessage(AF_INET, 24, IFA_F_SECONDARY, "10.1.0.7", "10.1.0.7");
    unsigned char broadcast[4] = {10, 1, 0, 255};
    nla_put(message.get(), IFA_BROADCAST, 4, broadcast);
    nla_put_string(message.get(), IFA_LABEL, "eth0:1");
    ifa_cacheinfo cache{};
    cache.ifa_valid = 300;
    cache.ifa_prefered = 150;
    nla_put(message.get(), IFA_CACHEINFO, sizeof(cache), &cache);
    auto address = Kernel::ParseAddress(nlmsg_hdr(message.get()));
    ASSERT_TRUE(address);
    EXPECT_EQ(address->family, AF_INET);
    EXPECT_EQ(address->index, 4);
    EXPECT_EQ(address->address, "10.1.0.7");
    EXPECT_EQ(address->peer, "");
    EXPECT_EQ(address->prefixLength, 24u);
    EXPECT_EQ(address->broadcast, "10.1.0.255");
    EXPECT_EQ(address->label, "eth0:1");
    EXPECT_EQ(address->flags, static_cast<std::uint32_t>(IFA_F_SECONDARY));
    EXPECT_EQ(address->validLifetime, 300u);
    EXPECT_EQ(address->preferredLifetime, 150u);
    // A secondary address that expires is a lease.
    EXPECT_TRUE(TknCtl::Linux::IsLeased(*address));

    // A point-to-point address: this end is IFA_LOCAL, the other IFA_ADDRESS.
    auto peer = Kernel::ParseAddress(
        nlmsg_hdr(AddressMessage(AF_INET, 32, IFA_F_PERMANENT, "10.9.0.1", "10.9.0.2").get()));
    EXPECT_EQ(peer->address, "10.9.0.1");
    EXPECT_EQ(peer->peer, "10.9.0.2");
    EXPECT_FALSE(TknCtl::Linux::IsLeased(*peer));
    // IPv6 gives IFA_ADDRESS alone; a message without an address, or of another kind, is none.
    EXPECT_EQ(Kernel::ParseAddress(nlmsg_hdr(AddressMessage(AF_INET6, 64, 0, nullptr, "2001:db8::1").get()))
                  ->address,
              "2001:db8::1");
    EXPECT_FALSE(Kernel::ParseAddress(nlmsg_hdr(AddressMessage(AF_INET6, 64, 0, nullptr, nullptr).get())));
    Message other(nlmsg_alloc_simple(RTM_NEWLINK, 0), nlmsg_free);
    EXPECT_FALSE(Kernel::ParseAddress(nlmsg_hdr(other.get())));
}

TEST(Addresses, ANewIpv4AddressGetsTheBroadcastOfItsSubnetAndADeleteNamesOnlyTheAddress) {
    Kernel::Address address;
    address.family = AF_INET;
    address.index = 4;
    address.address = "192.0.2.10";
    address.prefixLength = 26;
    Message add(Kernel::BuildAddressRequest(RTM_NEWADDR, address), nlmsg_free);
    EXPECT_EQ(nlmsg_hdr(add.get())->nlmsg_flags & (NLM_F_CREATE | NLM_F_EXCL), NLM_F_CREATE | NLM_F_EXCL);
    auto built = Kernel::ParseAddress(nlmsg_hdr(add.get()));
    ASSERT_TRUE(built);
    EXPECT_EQ(built->address, "192.0.2.10");
    EXPECT_EQ(built->prefixLength, 26u);
    EXPECT_EQ(built->broadcast, "192.0.2.63");
    EXPECT_EQ(built->index, 4);

    // /31 and /32 have no broadcast; IPv6 none either.
    address.prefixLength = 31;
    EXPECT_EQ(Kernel::ParseAddress(
                  nlmsg_hdr(Message(Kernel::BuildAddressRequest(RTM_NEWADDR, address), nlmsg_free).get()))
                  ->broadcast,
              "");
    address.prefixLength = 0;
    EXPECT_EQ(Kernel::ParseAddress(
                  nlmsg_hdr(Message(Kernel::BuildAddressRequest(RTM_NEWADDR, address), nlmsg_free).get()))
                  ->broadcast,
              "255.255.255.255");

    address.prefixLength = 26;
    Message remove(Kernel::BuildAddressRequest(RTM_DELADDR, address), nlmsg_free);
    nlmsghdr* header = nlmsg_hdr(remove.get());
    EXPECT_EQ(header->nlmsg_type, RTM_DELADDR);
    nlattr* tb[IFA_MAX + 1] = {};
    ASSERT_EQ(nlmsg_parse(header, sizeof(ifaddrmsg), tb, IFA_MAX, nullptr), 0);
    EXPECT_TRUE(tb[IFA_LOCAL]);
    EXPECT_FALSE(tb[IFA_BROADCAST]);

    // What is no address of its family is refused before anything is sent.
    address.address = "2001:db8::1";
    EXPECT_THROW(Kernel::BuildAddressRequest(RTM_NEWADDR, address), HostCtl::Lib::HostCtlException);
    address.family = AF_INET6;
    address.prefixLength = 129;
    EXPECT_THROW(Kernel::BuildAddressRequest(RTM_NEWADDR, address), HostCtl::Lib::HostCtlException);
}

TEST(Addresses, AnIpv6AddressIsStaticAutoconfiguredOrLeasedAndHasAState) {
    auto make = [](const char* text, unsigned prefix, std::uint32_t flags, unsigned protocol,
                   unsigned scope) {
        Kernel::Address address;
        address.family = AF_INET6;
        address.address = text;
        address.prefixLength = prefix;
        address.flags = flags;
        address.protocol = protocol;
        address.scope = scope;
        return address;
    };
    using TknCtl::Linux::Ipv6Origin;
    EXPECT_EQ(Ipv6Origin(make("2001:db8::1", 64, IFA_F_PERMANENT, 0, RT_SCOPE_UNIVERSE)),
              Ipv6Network::ORIGIN_STATIC);
    // The kernel's link-local address, with the maker said or not (older kernels).
    EXPECT_EQ(Ipv6Origin(make("fe80::1", 64, IFA_F_PERMANENT, IFAPROT_KERNEL_LL, RT_SCOPE_LINK)),
              Ipv6Network::ORIGIN_AUTOCONF);
    EXPECT_EQ(Ipv6Origin(make("fe80::1", 64, IFA_F_PERMANENT, 0, RT_SCOPE_LINK)),
              Ipv6Network::ORIGIN_AUTOCONF);
    EXPECT_EQ(Ipv6Origin(make("fe80::1", 10, IFA_F_PERMANENT, 0, RT_SCOPE_LINK)), Ipv6Network::ORIGIN_STATIC);
    // From router advertisements (said, a temporary address, or an expiring /64) and leased.
    EXPECT_EQ(Ipv6Origin(make("2001:db8::2", 64, 0, IFAPROT_KERNEL_RA, 0)), Ipv6Network::ORIGIN_AUTOCONF);
    EXPECT_EQ(Ipv6Origin(make("2001:db8::3", 64, IFA_F_TEMPORARY, 0, 0)), Ipv6Network::ORIGIN_AUTOCONF);
    EXPECT_EQ(Ipv6Origin(make("2001:db8::4", 64, 0, 0, 0)), Ipv6Network::ORIGIN_AUTOCONF);
    EXPECT_EQ(Ipv6Origin(make("2001:db8::5", 128, 0, 0, 0)), Ipv6Network::ORIGIN_DHCP);

    using TknCtl::Linux::Ipv6Status;
    EXPECT_EQ(Ipv6Status(make("2001:db8::1", 64, IFA_F_TENTATIVE | IFA_F_DADFAILED, 0, 0)),
              Ipv6Network::STATUS_DUPLICATED);
    EXPECT_EQ(Ipv6Status(make("2001:db8::1", 64, IFA_F_TENTATIVE, 0, 0)), Ipv6Network::STATUS_TENTATIVE);
    EXPECT_EQ(Ipv6Status(make("2001:db8::1", 64, IFA_F_DEPRECATED, 0, 0)), Ipv6Network::STATUS_DEPRECATED);
    EXPECT_EQ(Ipv6Status(make("2001:db8::1", 64, IFA_F_PERMANENT, 0, 0)), Ipv6Network::STATUS_PREFERRED);
}

TEST(Addresses, AChangeIsReadBackAndWhatTheKernelDoesNotHoldIsNamed) {
    using HostCtl::Network::IpConfig;
    using HostCtl::Network::Ipv4Address;
    using TknCtl::Linux::ConfigDifference;
    IpConfig before;
    before.SetUseIpv6(true);
    before.AddIpv6Network(Ipv6Network("2001:db8::1/64"));
    IpConfig wanted = before;
    wanted.SetIpv4Address(Ipv4Address("10.0.0.5"));
    wanted.SetIpv4Netmask(Ipv4Address("255.255.255.0"));
    wanted.SetIpv4Gateway(Ipv4Address("10.0.0.1"));
    wanted.RemoveIpv6Network(Ipv6Network("2001:db8::1/64"));
    wanted.AddIpv6Network(Ipv6Network("2001:db8::2/64"));
    IpConfig now = wanted;
    EXPECT_EQ(ConfigDifference(before, wanted, now), "");

    IpConfig other = now;
    other.SetIpv4Address(Ipv4Address("10.0.0.6"));
    EXPECT_EQ(ConfigDifference(before, wanted, other), "its IPv4 address is 10.0.0.6 netmask 255.255.255.0");
    other.SetIpv4UseNone();
    EXPECT_EQ(ConfigDifference(before, wanted, other), "it has no IPv4 address");
    other = now;
    other.SetIpv4Gateway(Ipv4Address());
    EXPECT_EQ(ConfigDifference(before, wanted, other), "its IPv4 gateway is none");
    other = now;
    other.SetUseIpv6RouterAdvertised(true);
    EXPECT_EQ(ConfigDifference(before, wanted, other), "router advertisements are accepted");
    other = now;
    other.AddIpv6Network(Ipv6Network("2001:db8::1/64"));
    EXPECT_EQ(ConfigDifference(before, wanted, other), "it still has the IPv6 address 2001:db8::1/64");
    other.RemoveIpv6Network(Ipv6Network("2001:db8::2/64"));
    EXPECT_EQ(ConfigDifference(before, wanted, other), "it has no IPv6 address 2001:db8::2/64");
    other.SetUseIpv6(false);
    EXPECT_EQ(ConfigDifference(before, wanted, other), "IPv6 is off");

    // A lease is the DHCP client's: its address is not compared.
    IpConfig leased = wanted;
    leased.SetUseDhcp(true);
    other = now;
    other.SetIpv4Address(Ipv4Address("10.9.9.9"));
    EXPECT_EQ(ConfigDifference(before, leased, other), "");
}

}  // namespace

// Value types: parsing, canonical printing, bounds and equality.
#include <arpa/inet.h>
#include <gtest/gtest.h>

#include <string>

#include "hostctl/exception.h"
#include "hostctl/misc.h"
#include "hostctl/network/types.h"

using namespace HostCtl::Network;
using HostCtl::Lib::HostCtlException;

namespace {

// The message of the exception a constructor throws, or "" when it throws none.
template <class T>
std::string ConstructionError(const std::string& text) {
    try {
        T value(text);
        (void)value;
    } catch (const HostCtlException& e) {
        return e.what();
    }
    return "";
}

}  // namespace

TEST(MacAddress, ParsesAndPrintsLowerCase) {
    EXPECT_EQ(MacAddress("02:AB:cd:0:1:ff").GetStringAddress(), "02:ab:cd:00:01:ff");
    EXPECT_EQ(MacAddress().GetStringAddress(), "00:00:00:00:00:00");
    EXPECT_EQ(MacAddress("02:ab:cd:00:01:ff"), MacAddress("02:AB:CD:0:1:FF"));
    EXPECT_NE(MacAddress("02:ab:cd:00:01:ff"), MacAddress("02:ab:cd:00:01:fe"));
}

TEST(MacAddress, ValidMeansWellFormedUnicast) {
    EXPECT_TRUE(MacAddress::IsValid("02:48:44:00:00:10"));
    EXPECT_TRUE(MacAddress::IsValid("00:1b:21:aa:bb:cc"));
    EXPECT_FALSE(MacAddress::IsValid("01:00:5e:00:00:01"));  // multicast
    EXPECT_FALSE(MacAddress::IsValid("ff:ff:ff:ff:ff:ff"));  // broadcast
    EXPECT_FALSE(MacAddress::IsValid("00:00:00:00:00:00"));
    for (const char* bad :
         {"", "02:48:44:00:00", "02:48:44:00:00:10:11", "02-48-44-00-00-10", "02:48:44:00:00:1g",
          "02:48:44:00:00:100", "02::44:00:00:10", " 02:48:44:00:00:10", "02:48:44:00:00:10 "}) {
        EXPECT_FALSE(MacAddress::IsValid(bad)) << bad;
        EXPECT_FALSE(MacAddress::IsWellFormed(bad)) << bad;
    }
    EXPECT_TRUE(MacAddress::IsWellFormed("ff:ff:ff:ff:ff:ff"));
}

TEST(MacAddress, MalformedTextIsQuotedInTheError) {
    EXPECT_EQ(ConstructionError<MacAddress>("nonsense"), "Invalid MAC address 'nonsense'");
    // Control characters cannot break the message into several lines.
    EXPECT_EQ(ConstructionError<MacAddress>("a\nb"), "Invalid MAC address 'a\\x0ab'");
}

TEST(Ipv4Address, ParsesDottedQuadOnly) {
    EXPECT_EQ(Ipv4Address("192.0.2.10").GetStringAddress(), "192.0.2.10");
    EXPECT_EQ(Ipv4Address().GetStringAddress(), "0.0.0.0");
    EXPECT_TRUE(Ipv4Address().IsUnspecified());
    for (const char* bad : {"", "192.0.2", "192.0.2.256", "192.0.2.1.5", "0x7f.0.0.1", "192.0.2.1/24", "::1",
                            " 192.0.2.1", "192.0.2.1 "}) {
        EXPECT_FALSE(Ipv4Address::IsValidAddress(bad)) << bad;
        EXPECT_NE(ConstructionError<Ipv4Address>(bad), "") << bad;
    }
    EXPECT_FALSE(Ipv4Address::IsValidAddress(std::string("192.0.2.1\0junk", 14)));
    EXPECT_EQ(ConstructionError<Ipv4Address>("1.2.3"), "Invalid IPv4 address '1.2.3'");
    EXPECT_EQ(Ipv4Address("10.0.0.1"), Ipv4Address("10.0.0.1"));
    EXPECT_NE(Ipv4Address("10.0.0.1"), Ipv4Address("10.0.0.2"));
    EXPECT_TRUE(Ipv4Address("255.255.254.0").IsNetmask());
    EXPECT_FALSE(Ipv4Address("255.0.255.0").IsNetmask());
}

TEST(Ipv4Address, PrintsWhatInetNtopPrints) {
    // Every value of each byte in every position, and a spread of whole addresses.
    auto check = [](std::uint32_t hostOrder) {
        auto address = Ipv4Address::FromHostOrder(hostOrder);
        char expected[INET_ADDRSTRLEN];
        inet_ntop(AF_INET, &address.GetAddress(), expected, sizeof(expected));
        ASSERT_EQ(address.GetStringAddress(), expected) << hostOrder;
    };
    for (std::uint32_t value = 0; value < 256; ++value) {
        for (int shift : {0, 8, 16, 24})
            check(value << shift);
        check(value * 0x01010101u);
    }
    for (std::uint32_t value = 1; value != 0 && value < 0xfff00000u; value += 104729u * 7)
        check(value);
    check(0xffffffffu);
}

TEST(Ipv6Address, PrintsTheCompressedLowerCaseForm) {
    EXPECT_EQ(Ipv6Address("2001:0DB8:0000:0000:0000:0000:0000:0001").GetStringAddress(), "2001:db8::1");
    EXPECT_EQ(Ipv6Address("2001:db8:0:1:0:0:0:1").GetStringAddress(), "2001:db8:0:1::1");
    EXPECT_EQ(Ipv6Address("FE80::0001").GetStringAddress(), "fe80::1");
    EXPECT_EQ(Ipv6Address().GetStringAddress(), "::");
    EXPECT_TRUE(Ipv6Address().IsUnspecified());
    EXPECT_EQ(Ipv6Address("2001:db8::1"), Ipv6Address("2001:0db8:0::0:1"));
    EXPECT_NE(Ipv6Address("2001:db8::1"), Ipv6Address("2001:db8::2"));
}

TEST(Ipv6Address, AcceptsIpv4MappedForms) {
    Ipv6Address mapped("::FFFF:192.0.2.1");
    EXPECT_TRUE(mapped.IsIpv4Mapped());
    EXPECT_EQ(mapped.GetStringAddress(), "::ffff:192.0.2.1");
    EXPECT_FALSE(Ipv6Address("2001:db8::1").IsIpv4Mapped());
    EXPECT_TRUE(Ipv6Address("fe80::1").IsLinkLocal());
}

TEST(Ipv6Address, RefusesMalformedText) {
    for (const char* bad : {"", ":::", "2001:db8::1::2", "2001:db8::g", "2001:db8::1/64", "fe80::1%eth0",
                            "1:2:3:4:5:6:7:8:9", "192.0.2.1", "::ffff:192.0.2.256"}) {
        EXPECT_FALSE(Ipv6Address::IsValidAddress(bad)) << bad;
        EXPECT_NE(ConstructionError<Ipv6Address>(bad), "") << bad;
    }
    EXPECT_EQ(ConstructionError<Ipv6Address>("zz::1"), "Invalid IPv6 address 'zz::1'");
}

TEST(IpAddress, BothFamiliesShareTheBase) {
    Ipv4Address v4("192.0.2.1");
    Ipv6Address v6("2001:db8::1");
    const IpAddress& a = v4;
    const IpAddress& b = v6;
    EXPECT_EQ(a.GetStringAddress(), "192.0.2.1");
    EXPECT_EQ(b.GetStringAddress(), "2001:db8::1");
    EXPECT_NE(a.GetFamily(), b.GetFamily());
}

TEST(Ipv4Network, PrefixLengthFromZeroTo32) {
    Ipv4Network network("192.0.2.77/24");
    EXPECT_EQ(network.GetAddress().GetStringAddress(), "192.0.2.77");
    EXPECT_EQ(network.GetNetwork().GetStringAddress(), "192.0.2.0");
    EXPECT_EQ(network.GetNetmask().GetStringAddress(), "255.255.255.0");
    EXPECT_EQ(network.GetPrefixLength(), 24u);
    EXPECT_EQ(network.GetStringAddress(), "192.0.2.77/24");
    EXPECT_TRUE(network.Contains(Ipv4Address("192.0.2.200")));
    EXPECT_FALSE(network.Contains(Ipv4Address("192.0.3.1")));
    EXPECT_EQ(Ipv4Network("0.0.0.0/0").GetNetmask().GetStringAddress(), "0.0.0.0");
    EXPECT_EQ(Ipv4Network("10.1.2.3/32").GetNetmask().GetStringAddress(), "255.255.255.255");
    EXPECT_EQ(Ipv4Network::NetmaskFromNumber(17).GetStringAddress(), "255.255.128.0");
    EXPECT_THROW(Ipv4Network::NetmaskFromNumber(33), HostCtlException);
    for (const char* bad : {"192.0.2.0/33", "192.0.2.0/", "192.0.2.0", "192.0.2.0/-1", "192.0.2.0/+8",
                            "192.0.2.0/2 4", "/24", "192.0.2/24", "2001:db8::/64", "192.0.2.0/0024"}) {
        EXPECT_FALSE(Ipv4Network::IsValidAddressAndNetmask(bad)) << bad;
        EXPECT_NE(ConstructionError<Ipv4Network>(bad), "") << bad;
    }
    EXPECT_EQ(Ipv4Network("0.0.0.0/0"), Ipv4Network());
    EXPECT_NE(Ipv4Network("192.0.2.0/24"), Ipv4Network("192.0.2.0/25"));
}

TEST(Ipv6Network, PrefixLengthFromZeroTo128) {
    Ipv6Network network("2001:DB8:10::10/64");
    EXPECT_EQ(network.GetAddress().GetStringAddress(), "2001:db8:10::10");
    EXPECT_EQ(network.GetNetmask(), 64u);
    EXPECT_EQ(network.GetNetwork().GetStringAddress(), "2001:db8:10::");
    EXPECT_EQ(network.GetStringAddress(), "2001:db8:10::10/64");
    EXPECT_TRUE(network.Contains(Ipv6Address("2001:db8:10::ffff")));
    EXPECT_EQ(Ipv6Network::NetmaskFromNumber(0).GetStringAddress(), "::");
    EXPECT_EQ(Ipv6Network::NetmaskFromNumber(64).GetStringAddress(), "ffff:ffff:ffff:ffff::");
    EXPECT_EQ(Ipv6Network::NetmaskFromNumber(65).GetStringAddress(), "ffff:ffff:ffff:ffff:8000::");
    EXPECT_EQ(Ipv6Network::NetmaskFromNumber(128).GetStringAddress(),
              "ffff:ffff:ffff:ffff:ffff:ffff:ffff:ffff");
    EXPECT_THROW(Ipv6Network::NetmaskFromNumber(129), HostCtlException);
    EXPECT_TRUE(Ipv6Network::IsValidAddressAndNetmask("::/0"));
    EXPECT_TRUE(Ipv6Network::IsValidAddressAndNetmask("::ffff:192.0.2.0/120"));
    for (const char* bad :
         {"1:2:3:4::/129", "1:2:3:4::", "1:2:3:4::/", "1:2:3:4::/x", "192.0.2.0/24", "fe80::1%eth0/64"}) {
        EXPECT_FALSE(Ipv6Network::IsValidAddressAndNetmask(bad)) << bad;
        EXPECT_NE(ConstructionError<Ipv6Network>(bad), "") << bad;
    }
    EXPECT_EQ(Ipv6Network().GetStringAddress(), "::/0");
}

TEST(Ipv6Network, EqualityIgnoresOriginAndState) {
    Ipv6Network a(Ipv6Address("2001:db8::1"), 64, Ipv6Network::ORIGIN_DHCP, Ipv6Network::STATUS_DEPRECATED);
    EXPECT_EQ(a, Ipv6Network("2001:db8::1/64"));
    EXPECT_NE(a, Ipv6Network("2001:db8::1/48"));
    EXPECT_NE(a, Ipv6Network("2001:db8::2/64"));
}

TEST(IpConfig, Ipv4TypesFollowTheSetters) {
    IpConfig config;
    config.SetUseDhcp(true);
    config.SetIpv4Address(Ipv4Address("192.0.2.10"));
    config.SetIpv4Netmask(Ipv4Address("255.255.255.0"));
    EXPECT_FALSE(config.GetUseDhcp());  // an address makes the configuration static
    EXPECT_FALSE(config.GetIpv4UseNone());
    EXPECT_EQ(config.GetIpv4Broadcast().GetStringAddress(), "192.0.2.255");
    config.SetIpv4Gateway(Ipv4Address("192.0.2.1"));
    config.SetUseDhcp(true);
    EXPECT_TRUE(config.GetUseDhcp());
    config.SetIpv4UseNone();
    EXPECT_TRUE(config.GetIpv4UseNone());
    EXPECT_FALSE(config.GetUseDhcp());
    EXPECT_TRUE(config.GetIpv4Address().IsUnspecified());
    EXPECT_TRUE(config.GetIpv4Gateway().IsUnspecified());
    EXPECT_TRUE(config.GetIpv4Broadcast().IsUnspecified());
}

TEST(IpConfig, Ipv6AddressesAreAddedOnceAndRemovedExactly) {
    IpConfig config;
    config.AddIpv6Network(Ipv6Network("2001:db8::1/64"));
    config.AddIpv6Network(Ipv6Network("2001:db8::2/64"));
    EXPECT_THROW(config.AddIpv6Network(Ipv6Network("2001:db8::1/48")), HostCtlException);
    EXPECT_THROW(config.RemoveIpv6Network(Ipv6Network("2001:db8::1/48")), HostCtlException);
    config.RemoveIpv6Network(Ipv6Network("2001:db8::1/64"));
    ASSERT_EQ(config.GetIpv6Network().size(), 1u);
    EXPECT_EQ(config.GetIpv6Network()[0].GetStringAddress(), "2001:db8::2/64");
    IpConfig copy = config;
    EXPECT_EQ(copy, config);
    copy.SetIpv6Gateway(Ipv6Address("2001:db8::ff"));
    EXPECT_NE(copy, config);
}

TEST(Misc, StringTokenizeSkipsEmptyPieces) {
    std::vector<std::string> out;
    HostCtl::Misc::StringTokenize("  a.example  b.example,c ", out, " ,");
    EXPECT_EQ(out, (std::vector<std::string>{"a.example", "b.example", "c"}));
    HostCtl::Misc::StringTokenize("", out, " ");
    EXPECT_EQ(out.size(), 3u);
    EXPECT_EQ(HostCtl::Misc::StrCat("vmnic", 5, std::string(" is "), "up"), "vmnic5 is up");
}

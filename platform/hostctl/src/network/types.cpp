#include "hostctl/network/types.h"

#include <arpa/inet.h>
#include <sys/socket.h>

#include <algorithm>
#include <cstring>

#include "core/text.h"
#include "hostctl/exception.h"

namespace HostCtl::Network {

using Lib::HostCtlException;
using TknCtl::Lib::Quote;

namespace {

int HexDigit(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return -1;
}

// Six groups of one or two hexadecimal digits separated by colons.
bool ParseMac(const std::string& text, MacAddress::Bytes& bytes) {
    std::size_t pos = 0;
    for (std::size_t i = 0; i < bytes.size(); ++i) {
        if (i > 0) {
            if (pos >= text.size() || text[pos] != ':') return false;
            ++pos;
        }
        int value = 0;
        std::size_t digits = 0;
        while (pos < text.size() && digits < 2 && HexDigit(text[pos]) >= 0) {
            value = value * 16 + HexDigit(text[pos]);
            ++pos;
            ++digits;
        }
        if (digits == 0) return false;
        bytes[i] = static_cast<std::uint8_t>(value);
    }
    return pos == text.size();
}

// Splits "address/prefix" at the last slash; the prefix is one to three decimal digits.
bool SplitPrefix(const std::string& text, std::string& address, unsigned& prefix, unsigned maximum) {
    std::size_t slash = text.rfind('/');
    if (slash == std::string::npos) return false;
    std::string digits = text.substr(slash + 1);
    if (digits.empty() || digits.size() > 3) return false;
    unsigned value = 0;
    for (char c : digits) {
        if (c < '0' || c > '9') return false;
        value = value * 10 + static_cast<unsigned>(c - '0');
    }
    if (value > maximum) return false;
    address = text.substr(0, slash);
    prefix = value;
    return true;
}

bool ParseIpv4(const std::string& text, in_addr& out) {
    // inet_pton stops at a NUL byte; text with an embedded NUL is not an address.
    if (text.find('\0') != std::string::npos) return false;
    return inet_pton(AF_INET, text.c_str(), &out) == 1;
}

bool ParseIpv6(const std::string& text, in6_addr& out) {
    if (text.find('\0') != std::string::npos) return false;
    return inet_pton(AF_INET6, text.c_str(), &out) == 1;
}

in6_addr MaskOf(unsigned prefixLength) {
    in6_addr mask{};
    for (unsigned i = 0; i < 16; ++i) {
        unsigned bits = prefixLength > i * 8 ? std::min(8u, prefixLength - i * 8) : 0;
        mask.s6_addr[i] = static_cast<std::uint8_t>(bits == 0 ? 0 : (0xff << (8 - bits)) & 0xff);
    }
    return mask;
}

}  // namespace

// ---- MacAddress ----

MacAddress::MacAddress() = default;

MacAddress::MacAddress(const std::string& text) {
    if (!ParseMac(text, bytes_)) throw HostCtlException("Invalid MAC address " + Quote(text));
}

bool MacAddress::IsWellFormed(const std::string& text) {
    Bytes bytes{};
    return ParseMac(text, bytes);
}

bool MacAddress::IsValid(const std::string& text) {
    Bytes bytes{};
    if (!ParseMac(text, bytes)) return false;
    MacAddress mac(bytes);
    return mac.IsUnicast() && !mac.IsZero();
}

std::string MacAddress::GetStringAddress() const {
    static const char digits[] = "0123456789abcdef";
    std::string out;
    out.reserve(17);
    for (std::size_t i = 0; i < bytes_.size(); ++i) {
        if (i > 0) out += ':';
        out += digits[bytes_[i] >> 4];
        out += digits[bytes_[i] & 0xf];
    }
    return out;
}

bool MacAddress::IsZero() const {
    return std::all_of(bytes_.begin(), bytes_.end(), [](std::uint8_t b) { return b == 0; });
}

// ---- IpAddress ----

IpAddress::~IpAddress() = default;

// ---- Ipv4Address ----

Ipv4Address::Ipv4Address(const std::string& text) {
    if (!ParseIpv4(text, address_)) throw HostCtlException("Invalid IPv4 address " + Quote(text));
}

Ipv4Address Ipv4Address::FromHostOrder(std::uint32_t value) {
    in_addr address{};
    address.s_addr = htonl(value);
    return Ipv4Address(address);
}

bool Ipv4Address::IsValidAddress(const std::string& text) {
    in_addr address{};
    return ParseIpv4(text, address);
}

// The dotted quad of an address, as inet_ntop writes it (four decimal numbers without leading
// zeros). Written here rather than by inet_ntop, which formats through sprintf: long listings
// print thousands of addresses, and that was a good part of their cost. The tests hold it to
// inet_ntop's text.
std::string Ipv4Address::GetStringAddress() const {
    const auto* bytes = reinterpret_cast<const unsigned char*>(&address_.s_addr);
    char buffer[INET_ADDRSTRLEN];
    char* out = buffer;
    for (int i = 0; i < 4; ++i) {
        unsigned value = bytes[i];
        if (value >= 100) {
            *out++ = static_cast<char>('0' + value / 100);
            value %= 100;
            *out++ = static_cast<char>('0' + value / 10);
        } else if (value >= 10) {
            *out++ = static_cast<char>('0' + value / 10);
        }
        *out++ = static_cast<char>('0' + value % 10);
        if (i < 3) *out++ = '.';
    }
    return std::string(buffer, static_cast<std::size_t>(out - buffer));
}

int Ipv4Address::GetFamily() const {
    return AF_INET;
}

std::uint32_t Ipv4Address::GetHostOrder() const {
    return ntohl(address_.s_addr);
}

bool Ipv4Address::IsNetmask() const {
    std::uint32_t inverted = ~GetHostOrder();
    return (inverted & (inverted + 1)) == 0;
}

// ---- Ipv6Address ----

Ipv6Address::Ipv6Address() {
    std::memset(&address_, 0, sizeof(address_));
}

Ipv6Address::Ipv6Address(const std::string& text) {
    if (!ParseIpv6(text, address_)) throw HostCtlException("Invalid IPv6 address " + Quote(text));
}

bool Ipv6Address::IsValidAddress(const std::string& text) {
    in6_addr address{};
    return ParseIpv6(text, address);
}

std::string Ipv6Address::GetStringAddress() const {
    char buffer[INET6_ADDRSTRLEN] = {};
    inet_ntop(AF_INET6, &address_, buffer, sizeof(buffer));
    return buffer;
}

int Ipv6Address::GetFamily() const {
    return AF_INET6;
}

bool Ipv6Address::IsUnspecified() const {
    return IN6_IS_ADDR_UNSPECIFIED(&address_);
}

bool Ipv6Address::IsIpv4Mapped() const {
    return IN6_IS_ADDR_V4MAPPED(&address_);
}

bool Ipv6Address::IsLinkLocal() const {
    return IN6_IS_ADDR_LINKLOCAL(&address_);
}

bool Ipv6Address::operator==(const Ipv6Address& other) const {
    return std::memcmp(&address_, &other.address_, sizeof(address_)) == 0;
}

bool Ipv6Address::operator<(const Ipv6Address& other) const {
    return std::memcmp(&address_, &other.address_, sizeof(address_)) < 0;
}

// ---- Ipv4Network ----

Ipv4Network::Ipv4Network(const std::string& text) {
    std::string address;
    if (!SplitPrefix(text, address, prefixLength_, 32) || !Ipv4Address::IsValidAddress(address)) {
        throw HostCtlException("Invalid IPv4 network " + Quote(text) +
                               " (expected address/prefix length 0-32)");
    }
    address_ = Ipv4Address(address);
}

Ipv4Network::Ipv4Network(const Ipv4Address& address, unsigned prefixLength)
    : address_(address), prefixLength_(prefixLength) {
    if (prefixLength > 32) {
        throw HostCtlException("Invalid IPv4 prefix length " + std::to_string(prefixLength) + " (0-32)");
    }
}

bool Ipv4Network::IsValidAddressAndNetmask(const std::string& text) {
    std::string address;
    unsigned prefix = 0;
    return SplitPrefix(text, address, prefix, 32) && Ipv4Address::IsValidAddress(address);
}

Ipv4Address Ipv4Network::NetmaskFromNumber(unsigned prefixLength) {
    if (prefixLength > 32) {
        throw HostCtlException("Invalid IPv4 prefix length " + std::to_string(prefixLength) + " (0-32)");
    }
    std::uint32_t mask = prefixLength == 0 ? 0 : ~std::uint32_t{0} << (32 - prefixLength);
    return Ipv4Address::FromHostOrder(mask);
}

Ipv4Address Ipv4Network::GetNetwork() const {
    return Ipv4Address::FromHostOrder(address_.GetHostOrder() & GetNetmask().GetHostOrder());
}

std::string Ipv4Network::GetStringAddress() const {
    return address_.GetStringAddress() + "/" + std::to_string(prefixLength_);
}

bool Ipv4Network::Contains(const Ipv4Address& address) const {
    std::uint32_t mask = GetNetmask().GetHostOrder();
    return (address.GetHostOrder() & mask) == (address_.GetHostOrder() & mask);
}

// ---- Ipv6Network ----

Ipv6Network::Ipv6Network(const std::string& text) {
    std::string address;
    if (!SplitPrefix(text, address, prefixLength_, 128) || !Ipv6Address::IsValidAddress(address)) {
        throw HostCtlException("Invalid IPv6 network " + Quote(text) +
                               " (expected address/prefix length 0-128)");
    }
    address_ = Ipv6Address(address);
}

Ipv6Network::Ipv6Network(const Ipv6Address& address, unsigned prefixLength, int origin, int status)
    : address_(address), prefixLength_(prefixLength), origin_(origin), status_(status) {
    if (prefixLength > 128) {
        throw HostCtlException("Invalid IPv6 prefix length " + std::to_string(prefixLength) + " (0-128)");
    }
}

bool Ipv6Network::IsValidAddressAndNetmask(const std::string& text) {
    std::string address;
    unsigned prefix = 0;
    return SplitPrefix(text, address, prefix, 128) && Ipv6Address::IsValidAddress(address);
}

Ipv6Address Ipv6Network::NetmaskFromNumber(unsigned prefixLength) {
    if (prefixLength > 128) {
        throw HostCtlException("Invalid IPv6 prefix length " + std::to_string(prefixLength) + " (0-128)");
    }
    return Ipv6Address(MaskOf(prefixLength));
}

Ipv6Address Ipv6Network::GetNetwork() const {
    in6_addr network = address_.GetAddress();
    in6_addr mask = MaskOf(prefixLength_);
    for (int i = 0; i < 16; ++i)
        network.s6_addr[i] &= mask.s6_addr[i];
    return Ipv6Address(network);
}

std::string Ipv6Network::GetStringAddress() const {
    return address_.GetStringAddress() + "/" + std::to_string(prefixLength_);
}

bool Ipv6Network::Contains(const Ipv6Address& address) const {
    return Ipv6Network(address, prefixLength_).GetNetwork() == GetNetwork();
}

// ---- IpConfig ----

void IpConfig::SetUseDhcp(bool useDhcp) {
    useDhcp_ = useDhcp;
    if (useDhcp) ipv4UseNone_ = false;
}

void IpConfig::SetIpv4UseNone() {
    ipv4UseNone_ = true;
    useDhcp_ = false;
    dhcpDns_ = false;
    ipv4Address_ = Ipv4Address();
    ipv4Netmask_ = Ipv4Address();
    ipv4Gateway_ = Ipv4Address();
}

void IpConfig::SetIpv4Address(const Ipv4Address& address) {
    ipv4Address_ = address;
    useDhcp_ = false;
    ipv4UseNone_ = false;
}

void IpConfig::SetIpv4Netmask(const Ipv4Address& netmask) {
    ipv4Netmask_ = netmask;
    useDhcp_ = false;
    ipv4UseNone_ = false;
}

Ipv4Address IpConfig::GetIpv4Broadcast() const {
    if (ipv4Address_.IsUnspecified() || ipv4Netmask_.IsUnspecified()) return Ipv4Address();
    return Ipv4Address::FromHostOrder(ipv4Address_.GetHostOrder() | ~ipv4Netmask_.GetHostOrder());
}

void IpConfig::AddIpv6Network(const Ipv6Network& network) {
    for (const auto& existing : ipv6Networks_) {
        if (existing.GetAddress() == network.GetAddress()) {
            throw HostCtlException("IPv6 address " + network.GetAddress().GetStringAddress() +
                                   " is already configured as " + existing.GetStringAddress());
        }
    }
    ipv6Networks_.push_back(network);
}

void IpConfig::RemoveIpv6Network(const Ipv6Network& network) {
    auto it = std::find(ipv6Networks_.begin(), ipv6Networks_.end(), network);
    if (it == ipv6Networks_.end()) {
        throw HostCtlException("IPv6 address " + network.GetStringAddress() + " is not configured");
    }
    ipv6Networks_.erase(it);
}

bool IpConfig::operator==(const IpConfig& other) const {
    if (ipv6Networks_.size() != other.ipv6Networks_.size()) return false;
    for (std::size_t i = 0; i < ipv6Networks_.size(); ++i) {
        const auto& a = ipv6Networks_[i];
        const auto& b = other.ipv6Networks_[i];
        if (a != b || a.GetIpv6AddressType() != b.GetIpv6AddressType() ||
            a.GetIpv6AddressStatus() != b.GetIpv6AddressStatus()) {
            return false;
        }
    }
    return useDhcp_ == other.useDhcp_ && ipv4UseNone_ == other.ipv4UseNone_ &&
           ipv4Address_ == other.ipv4Address_ && ipv4Netmask_ == other.ipv4Netmask_ &&
           ipv4Gateway_ == other.ipv4Gateway_ && dhcpDns_ == other.dhcpDns_ && useIpv6_ == other.useIpv6_ &&
           useIpv6Dhcp_ == other.useIpv6Dhcp_ && useIpv6RouterAdvertised_ == other.useIpv6RouterAdvertised_ &&
           ipv6DhcpDns_ == other.ipv6DhcpDns_ && ipv6Gateway_ == other.ipv6Gateway_;
}

}  // namespace HostCtl::Network

// Value types of the host's network model: MAC and IP addresses, networks, the IP
// configuration of an interface and the parameters that name a distributed port or an
// opaque network. All of them are plain values, copied freely.
//
// Text is parsed and printed with inet_pton/inet_ntop: IPv4 in dotted-quad form, IPv6 in
// the standard compressed lower-case form. A constructor given malformed text throws
// HostCtl::Lib::HostCtlException with a message that quotes the text.
#pragma once

#include <netinet/in.h>

#include <array>
#include <cstdint>
#include <string>
#include <vector>

namespace HostCtl::Network {

// An Ethernet MAC address. Text form: six pairs of hexadecimal digits separated by colons,
// printed in lower case ("00:50:56:6a:01:02").
class MacAddress {
public:
    using Bytes = std::array<std::uint8_t, 6>;

    MacAddress();  // 00:00:00:00:00:00, the unset address
    explicit MacAddress(const std::string& text);
    explicit MacAddress(const Bytes& bytes) : bytes_(bytes) {}

    // True when text is a well-formed MAC address that a single interface may carry: not
    // the all-zero address and not a group (multicast or broadcast) address.
    static bool IsValid(const std::string& text);
    // True when text has the MAC address form, whatever address it names.
    static bool IsWellFormed(const std::string& text);

    std::string GetStringAddress() const;
    const Bytes& GetBytes() const { return bytes_; }
    bool IsZero() const;
    bool IsUnicast() const { return (bytes_[0] & 0x01) == 0; }

    bool operator==(const MacAddress& other) const { return bytes_ == other.bytes_; }
    bool operator!=(const MacAddress& other) const { return !(*this == other); }

private:
    Bytes bytes_{};
};

// An IP address of either family; Ipv4Address and Ipv6Address derive from it.
class IpAddress {
public:
    virtual ~IpAddress();
    // The address as text.
    virtual std::string GetStringAddress() const = 0;
    // AF_INET or AF_INET6.
    virtual int GetFamily() const = 0;
    // True for the unset address (0.0.0.0 or ::).
    virtual bool IsUnspecified() const = 0;

protected:
    IpAddress() = default;
    IpAddress(const IpAddress&) = default;
    IpAddress& operator=(const IpAddress&) = default;
};

class Ipv4Address : public IpAddress {
public:
    Ipv4Address() = default;  // 0.0.0.0, the unset address
    explicit Ipv4Address(const std::string& text);
    explicit Ipv4Address(const in_addr& address) : address_(address) {}
    static Ipv4Address FromHostOrder(std::uint32_t value);

    // True when text is an IPv4 address in dotted-quad form.
    static bool IsValidAddress(const std::string& text);

    std::string GetStringAddress() const override;
    int GetFamily() const override;
    bool IsUnspecified() const override { return address_.s_addr == 0; }

    const in_addr& GetAddress() const { return address_; }
    std::uint32_t GetHostOrder() const;
    // True when the address is a contiguous netmask (ones followed by zeros).
    bool IsNetmask() const;

    bool operator==(const Ipv4Address& other) const { return address_.s_addr == other.address_.s_addr; }
    bool operator!=(const Ipv4Address& other) const { return !(*this == other); }
    bool operator<(const Ipv4Address& other) const { return GetHostOrder() < other.GetHostOrder(); }

private:
    in_addr address_{};
};

class Ipv6Address : public IpAddress {
public:
    Ipv6Address();  // ::, the unset address
    explicit Ipv6Address(const std::string& text);
    explicit Ipv6Address(const in6_addr& address) : address_(address) {}

    // True when text is an IPv6 address (the dotted-quad tail of IPv4-mapped and
    // IPv4-compatible forms included; no zone index, no prefix length).
    static bool IsValidAddress(const std::string& text);

    std::string GetStringAddress() const override;
    int GetFamily() const override;
    bool IsUnspecified() const override;

    const in6_addr& GetAddress() const { return address_; }
    bool IsIpv4Mapped() const;
    bool IsLinkLocal() const;

    bool operator==(const Ipv6Address& other) const;
    bool operator!=(const Ipv6Address& other) const { return !(*this == other); }
    bool operator<(const Ipv6Address& other) const;

private:
    in6_addr address_{};
};

// An IPv4 address with a prefix length, "a.b.c.d/n" with n from 0 to 32. The address is
// kept as given; GetNetwork() yields it with the host bits cleared.
class Ipv4Network {
public:
    Ipv4Network() = default;  // 0.0.0.0/0
    explicit Ipv4Network(const std::string& text);
    Ipv4Network(const Ipv4Address& address, unsigned prefixLength);

    static bool IsValidAddressAndNetmask(const std::string& text);
    // The netmask of a prefix length, e.g. 24 -> 255.255.255.0. Throws above 32.
    static Ipv4Address NetmaskFromNumber(unsigned prefixLength);

    const Ipv4Address& GetAddress() const { return address_; }
    Ipv4Address GetNetwork() const;
    Ipv4Address GetNetmask() const { return NetmaskFromNumber(prefixLength_); }
    unsigned GetPrefixLength() const { return prefixLength_; }
    // "address/prefix", the address as given.
    std::string GetStringAddress() const;
    // True when address lies within this network.
    bool Contains(const Ipv4Address& address) const;

    // Same address and same prefix length.
    bool operator==(const Ipv4Network& other) const {
        return address_ == other.address_ && prefixLength_ == other.prefixLength_;
    }
    bool operator!=(const Ipv4Network& other) const { return !(*this == other); }

private:
    Ipv4Address address_;
    unsigned prefixLength_ = 0;
};

// An IPv6 address with a prefix length, "address/n" with n from 0 to 128. On an interface it
// also carries where the address came from and its state (see the constants below).
class Ipv6Network {
public:
    // Origins of an interface address.
    static constexpr int ORIGIN_STATIC = 0;
    static constexpr int ORIGIN_AUTOCONF = 7;
    static constexpr int ORIGIN_DHCP = 9;
    // States of an interface address.
    static constexpr int STATUS_PREFERRED = 1;
    static constexpr int STATUS_TENTATIVE = 2;
    static constexpr int STATUS_DUPLICATED = 3;
    static constexpr int STATUS_DEPRECATED = 5;

    Ipv6Network() = default;  // ::/0
    explicit Ipv6Network(const std::string& text);
    Ipv6Network(const Ipv6Address& address, unsigned prefixLength, int origin = ORIGIN_STATIC,
                int status = STATUS_PREFERRED);

    static bool IsValidAddressAndNetmask(const std::string& text);
    // The mask of a prefix length, e.g. 64 -> ffff:ffff:ffff:ffff::. Throws above 128.
    static Ipv6Address NetmaskFromNumber(unsigned prefixLength);

    const Ipv6Address& GetAddress() const { return address_; }
    Ipv6Address GetNetwork() const;
    // The prefix length.
    unsigned GetNetmask() const { return prefixLength_; }
    // "address/prefix".
    std::string GetStringAddress() const;
    bool Contains(const Ipv6Address& address) const;

    int GetIpv6AddressType() const { return origin_; }
    void SetIpv6AddressType(int origin) { origin_ = origin; }
    int GetIpv6AddressStatus() const { return status_; }
    void SetIpv6AddressStatus(int status) { status_ = status; }

    // Same address and same prefix length; origin and state are not compared.
    bool operator==(const Ipv6Network& other) const {
        return address_ == other.address_ && prefixLength_ == other.prefixLength_;
    }
    bool operator!=(const Ipv6Network& other) const { return !(*this == other); }

private:
    Ipv6Address address_;
    unsigned prefixLength_ = 0;
    int origin_ = ORIGIN_STATIC;
    int status_ = STATUS_PREFERRED;
};

// The IP configuration of a Tarkon interface. A default configuration has no IPv4 address
// (type "none" is not set either: the address is simply unset), IPv6 off and no addresses.
class IpConfig {
public:
    // IPv4. The address type is DHCP when GetUseDhcp(), none when GetIpv4UseNone(),
    // otherwise static. Setting an address or a netmask makes the type static.
    bool GetUseDhcp() const { return useDhcp_; }
    void SetUseDhcp(bool useDhcp);
    bool GetIpv4UseNone() const { return ipv4UseNone_; }
    // Removes the IPv4 settings: address, netmask and gateway are unset.
    void SetIpv4UseNone();
    const Ipv4Address& GetIpv4Address() const { return ipv4Address_; }
    void SetIpv4Address(const Ipv4Address& address);
    const Ipv4Address& GetIpv4Netmask() const { return ipv4Netmask_; }
    void SetIpv4Netmask(const Ipv4Address& netmask);
    const Ipv4Address& GetIpv4Gateway() const { return ipv4Gateway_; }
    void SetIpv4Gateway(const Ipv4Address& gateway) { ipv4Gateway_ = gateway; }
    // The directed broadcast address of address and netmask; unset without both.
    Ipv4Address GetIpv4Broadcast() const;
    bool GetDhcpDns() const { return dhcpDns_; }
    void SetDhcpDns(bool dhcpDns) { dhcpDns_ = dhcpDns; }

    // IPv6.
    bool GetUseIpv6() const { return useIpv6_; }
    void SetUseIpv6(bool useIpv6) { useIpv6_ = useIpv6; }
    bool GetUseIpv6Dhcp() const { return useIpv6Dhcp_; }
    void SetUseIpv6Dhcp(bool useDhcp) { useIpv6Dhcp_ = useDhcp; }
    bool GetUseIpv6RouterAdvertised() const { return useIpv6RouterAdvertised_; }
    void SetUseIpv6RouterAdvertised(bool use) { useIpv6RouterAdvertised_ = use; }
    bool GetIpv6DhcpDns() const { return ipv6DhcpDns_; }
    void SetIpv6DhcpDns(bool dhcpDns) { ipv6DhcpDns_ = dhcpDns; }
    const Ipv6Address& GetIpv6Gateway() const { return ipv6Gateway_; }
    void SetIpv6Gateway(const Ipv6Address& gateway) { ipv6Gateway_ = gateway; }
    const std::vector<Ipv6Network>& GetIpv6Network() const { return ipv6Networks_; }
    // Adds an address; throws HostCtlException when the address is already configured
    // (with any prefix length).
    void AddIpv6Network(const Ipv6Network& network);
    // Removes the address with that prefix length; throws HostCtlException when it is not
    // configured.
    void RemoveIpv6Network(const Ipv6Network& network);
    // Replaces the address list as it is (no checks); for loading stored configurations.
    void SetIpv6Networks(std::vector<Ipv6Network> networks) { ipv6Networks_ = std::move(networks); }

    bool operator==(const IpConfig& other) const;
    bool operator!=(const IpConfig& other) const { return !(*this == other); }

private:
    bool useDhcp_ = false;
    bool ipv4UseNone_ = false;
    Ipv4Address ipv4Address_;
    Ipv4Address ipv4Netmask_;
    Ipv4Address ipv4Gateway_;
    bool dhcpDns_ = false;
    bool useIpv6_ = false;
    bool useIpv6Dhcp_ = false;
    bool useIpv6RouterAdvertised_ = false;
    bool ipv6DhcpDns_ = false;
    Ipv6Address ipv6Gateway_;
    std::vector<Ipv6Network> ipv6Networks_;
};

// Names a port of a distributed switch: the switch's UUID, the port ID and the connection ID.
class DVPortParam {
public:
    DVPortParam() = default;
    DVPortParam(std::string switchUuid, std::string portId, std::uint32_t connectionId = 0)
        : switchUuid_(std::move(switchUuid)), portId_(std::move(portId)), connectionId_(connectionId) {}

    const std::string& GetSwitchUuid() const { return switchUuid_; }
    void SetSwitchUuid(const std::string& uuid) { switchUuid_ = uuid; }
    const std::string& GetPortId() const { return portId_; }
    void SetPortId(const std::string& portId) { portId_ = portId; }
    std::uint32_t GetConnectionId() const { return connectionId_; }
    void SetConnectionId(std::uint32_t connectionId) { connectionId_ = connectionId; }

    bool operator==(const DVPortParam& other) const {
        return switchUuid_ == other.switchUuid_ && portId_ == other.portId_ &&
               connectionId_ == other.connectionId_;
    }
    bool operator!=(const DVPortParam& other) const { return !(*this == other); }

private:
    std::string switchUuid_;
    std::string portId_;
    std::uint32_t connectionId_ = 0;
};

// Names an opaque network: its ID, its type and the external ID of the attachment.
class OpaqueNetworkParam {
public:
    OpaqueNetworkParam() = default;
    OpaqueNetworkParam(std::string networkId, std::string networkType, std::string externalId)
        : networkId_(std::move(networkId)),
          networkType_(std::move(networkType)),
          externalId_(std::move(externalId)) {}

    const std::string& GetNetworkId() const { return networkId_; }
    void SetNetworkId(const std::string& id) { networkId_ = id; }
    const std::string& GetNetworkType() const { return networkType_; }
    void SetNetworkType(const std::string& type) { networkType_ = type; }
    const std::string& GetExternalId() const { return externalId_; }
    void SetExternalId(const std::string& id) { externalId_ = id; }

    bool operator==(const OpaqueNetworkParam& other) const {
        return networkId_ == other.networkId_ && networkType_ == other.networkType_ &&
               externalId_ == other.externalId_;
    }
    bool operator!=(const OpaqueNetworkParam& other) const { return !(*this == other); }

private:
    std::string networkId_;
    std::string networkType_;
    std::string externalId_;
};

}  // namespace HostCtl::Network

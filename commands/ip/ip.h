// The command classes of the host's IP services: routes, DNS, neighbours, connections, global
// IP settings and multicast groups; and of its netstack instances and IPsec.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "frame/command.h"
#include "frame/factories.h"
#include "hostctl/network/types.h"

namespace TalvexCli::NetworkNamespace {

// The factories of the two groups (registry_services.cpp, registry_stacks.cpp).
const FactoryList& IpServiceFactories();
const FactoryList& IpStackFactories();

// ---------------------------------------------------------------- routes, DNS, neighbours,
// connections, global IP settings and multicast groups (ip_route_*.cpp, ip_dns_*.cpp,
// ip_neighbor_*.cpp, ip_connection_list.cpp, ip_get.cpp, ip_set.cpp, multicast_group_list.cpp,
// registry_services.cpp)

class IpRouteIpv4Add : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpRouteIpv4Add)
};

class IpRouteIpv4List : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpRouteIpv4List)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpRouteIpv4Remove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpRouteIpv4Remove)
};

class IpRouteIpv6Add : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpRouteIpv6Add)
};

class IpRouteIpv6List : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpRouteIpv6List)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpRouteIpv6Remove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpRouteIpv6Remove)
};

class IpDNSServerList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpDNSServerList)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpDNSServerAdd : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpDNSServerAdd)
};

class IpDNSServerRemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpDNSServerRemove)
};

class IpDNSSearchList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpDNSSearchList)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpDNSSearchAdd : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpDNSSearchAdd)
};

class IpDNSSearchRemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpDNSSearchRemove)
};

class IpNeighborList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpNeighborList)
public:
    std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpNeighborRemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpNeighborRemove)
};

class IpConnectionList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpConnectionList)
public:
    std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpGet)
public:
    std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpSet)
};

class MulticastGroupList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(MulticastGroupList)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

namespace IpServices {
// The address of a DNS server as typed: tried as IPv4 first, then as IPv6. Neither: adds
// "The specified address '...' is not recognised as a valid IP address" and returns nothing.
std::unique_ptr<HostCtl::Network::IpAddress> DnsServerAddress(const std::string& text,
                                                              const OutputPtr& output);
}  // namespace IpServices

// ---------------------------------------------------------------- netstack instances and IPsec
// (ip_netstack_*.cpp, ip_ipsec_*.cpp, registry_stacks.cpp)

class IpNetstackInstanceAdd : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpNetstackInstanceAdd)
};

class IpNetstackInstanceList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpNetstackInstanceList)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpNetstackInstanceGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpNetstackInstanceGet)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpNetstackInstanceSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpNetstackInstanceSet)
};

class IpNetstackInstanceRemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpNetstackInstanceRemove)
};

class IpIpsecSAAdd : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpIpsecSAAdd)
};

class IpIpsecSAList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpIpsecSAList)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpIpsecSARemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpIpsecSARemove)
};

class IpIpsecSPAdd : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpIpsecSPAdd)
};

class IpIpsecSPList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpIpsecSPList)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpIpsecSPRemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpIpsecSPRemove)
};

// A lifetime in seconds as text: "infinite" for 0, else hours, minutes and seconds, each
// present when not zero and followed by a blank ("1h 2m 5s ").
std::string ConvertToHrsMinsAndSecs(unsigned int seconds);

namespace Ipsec {
// Reads an SPI: hexadecimal digits, optionally after "0x", the whole text, at most 32 bits.
bool ParseSpi(const std::string& text, std::uint32_t& spi);
// The message for an SPI that ParseSpi refuses.
std::string SpiMessage(const std::string& text);
// The name an enumeration value has in one of the IPsec name tables.
std::string TableName(const std::vector<std::string>& table, std::uint32_t value);
}  // namespace Ipsec

}  // namespace TalvexCli::NetworkNamespace

// The host's IP services on its Tarkon netstacks: routes and default gateways, neighbour
// (ARP and IPv6 neighbour discovery) tables, the resolver configuration, and the records of
// connections.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "hostctl/lib/object.h"
#include "hostctl/network/types.h"

namespace HostCtl::Network {

// A socket of a netstack. state is a TCP state index (0 CLOSED ... 10 TIME_WAIT).
struct TcpIpConnection {
    std::uint32_t recvQ = 0;
    std::uint32_t sendQ = 0;
    std::string localAddress;
    std::uint16_t localPort = 0;
    std::string foreignAddress;
    std::uint16_t foreignPort = 0;
    std::uint32_t state = 0;
    std::uint32_t worldId = 0;
    std::string ccAlgo;
};

// A neighbour table entry. state: for IPv6, 0 incomplete, 1 reachable, 2 stale, 3 delay,
// 4 probe; 0 for IPv4.
template <class Address>
struct Neighbor {
    Address address;
    std::string linkLayerAddress;
    std::string interfaceName;
    std::uint32_t expiry = 0;  // seconds
    std::uint32_t state = 0;
};
using Ipv4Neighbor = Neighbor<Ipv4Address>;
using Ipv6Neighbor = Neighbor<Ipv6Address>;

// A route: destination network, gateway (unset for a network the interface is on) and the
// Tarkon interface that carries it.
struct Ipv4Route {
    Ipv4Network network;
    Ipv4Address gateway;
    std::string interfaceName;
};
struct Ipv6Route {
    Ipv6Network network;
    Ipv6Address gateway;
    std::string interfaceName;
};

}  // namespace HostCtl::Network

namespace TknCtl::Network {

// Routes, default gateways and neighbours of one netstack (the one given at construction, or
// the one SetNetstackInstanceKey selects). Every operation throws HostCtlException for a
// netstack the host does not have.
//
// The host routes like a real stack: a route goes through the enabled Tarkon interface of the
// netstack whose subnet holds its gateway (a gateway no interface reaches is refused); one
// route per destination network; the default route (DEFAULT_IPV4_ROUTE, DEFAULT_IPV6_ROUTE) is
// the route of the default gateway. The configured default gateway is kept apart: it stays
// when its route goes (an interface leaving the gateway's subnet) and its route comes back
// when an interface reaches it again.
class RoutingInfoImpl : public TknCtl::Lib::TknCtlObject {
public:
    static const HostCtl::Network::Ipv4Network DEFAULT_IPV4_ROUTE;  // 0.0.0.0/0
    static const HostCtl::Network::Ipv6Network DEFAULT_IPV6_ROUTE;  // ::/0

    explicit RoutingInfoImpl(const std::string& netstack);
    ~RoutingInfoImpl() override;
    void SetNetstackInstanceKey(const std::string& netstack);

    // Routes, in the host's order. Adding the default route sets the configured default
    // gateway; a duplicate destination, or removing a route the netstack does not have, is
    // refused. A network is taken with its host bits cleared.
    std::vector<HostCtl::Network::Ipv4Route> GetCurrentTarkonRoutes();
    std::vector<HostCtl::Network::Ipv6Route> GetCurrentIpv6TarkonRoutes();
    void AddTarkonRoute(const HostCtl::Network::Ipv4Network& network,
                        const HostCtl::Network::Ipv4Address& gateway);
    void AddIpv6TarkonRoute(const HostCtl::Network::Ipv6Network& network,
                            const HostCtl::Network::Ipv6Address& gateway);
    void RemoveTarkonRoute(const HostCtl::Network::Ipv4Network& network,
                           const HostCtl::Network::Ipv4Address& gateway);
    void RemoveIpv6TarkonRoute(const HostCtl::Network::Ipv6Network& network,
                               const HostCtl::Network::Ipv6Address& gateway);
    // Where the route to the network came from: "MANUAL" (configured), "DHCP" (learned by
    // DHCP). Throws when the netstack has no route to the network.
    std::string GetDefaultGatewaySource(const HostCtl::Network::Ipv4Network& network);

    // The gateway of the default route in force (unset when there is none), and the
    // configured default gateway.
    HostCtl::Network::Ipv4Address GetTarkonDefaultGateway();
    HostCtl::Network::Ipv6Address GetIpv6TarkonDefaultGateway();
    HostCtl::Network::Ipv4Address GetTarkonConfigDefaultGateway();
    HostCtl::Network::Ipv6Address GetIpv6TarkonConfigDefaultGateway();
    // Sets the default gateway (the default route replaces the old one); the unset address
    // clears it and removes the default route. fromDhcp marks a gateway learned by DHCP.
    void SetTarkonDefaultGateway(const HostCtl::Network::Ipv4Address& gateway, bool fromDhcp);
    void SetIpv6TarkonDefaultGateway(const HostCtl::Network::Ipv6Address& gateway);

    // Neighbours of the netstack, of one interface or of all (empty name), in table order.
    // IPv6 neighbours are not reported while IPv6 is off on the host.
    void GetCurrentIpv4TarkonNeighbors(std::vector<HostCtl::Network::Ipv4Neighbor>& out,
                                       const std::string& interfaceName);
    void GetCurrentIpv6TarkonNeighbors(std::vector<HostCtl::Network::Ipv6Neighbor>& out,
                                       const std::string& interfaceName);
    // "Dynamic", "Static", "Router", ... as the table keeps it; throws for an entry the table
    // does not have.
    std::string GetIpv4NeighborType(const HostCtl::Network::Ipv4Neighbor& neighbor);
    std::string GetIpv6NeighborType(const HostCtl::Network::Ipv6Neighbor& neighbor);
    // "Incomplete", "Reachable", "Stale", "Delay", "Probe"; "Unknown" for another value.
    std::string GetIpv6NeighborState(const HostCtl::Network::Ipv6Neighbor& neighbor);
    // Removes the entries of the address on the entry's interface (every interface of the
    // netstack when the name is empty); throws when there is none.
    void RemoveIpv4Neighbor(const HostCtl::Network::Ipv4Neighbor& neighbor);
    void RemoveIpv6Neighbor(const HostCtl::Network::Ipv6Neighbor& neighbor);

private:
    std::string netstack_;
};

// The resolver configuration of one netstack: name servers in use order and search domains in
// search order. The object works on its own copy: Refresh() reads the host's configuration
// (any other operation reads it first when the object has not read it yet), the Add and
// Remove operations change the copy, SaveConfig() stores it. Adding a server or domain already present, removing
// one that is absent, or a search domain that is no valid domain name is refused.
class DnsConfigImpl : public TknCtl::Lib::TknCtlObject, public TknCtl::Lib::Refreshable {
public:
    explicit DnsConfigImpl(const std::string& netstack);
    ~DnsConfigImpl() override;

    void Refresh() override;
    // The name servers as read by the last Refresh() and changed since.
    const std::vector<std::string>& GetNameServers() const { return servers_; }

    void AddNameServer(HostCtl::Network::IpAddress& server);
    void RemoveNameServer(HostCtl::Network::IpAddress& server);
    void RemoveNameServers();
    // The search domains separated by single blanks.
    std::string GetSearchDomainsString();
    void AddSearchDomain(const std::string& domain);
    void RemoveSearchDomain(std::string domain);
    void SaveConfig();

private:
    void Load();
    void LoadIfStale();

    std::string netstack_;
    bool loaded_ = false;
    std::vector<std::string> servers_;
    std::vector<std::string> searchDomains_;
};

}  // namespace TknCtl::Network

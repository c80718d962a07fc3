// Routes and neighbours of a real host's netstacks.
//
// The operations (TknCtl::Network::RoutingInfoImpl, src/network/routing.cpp) keep the rules
// every host shares: one route per destination network, a gateway on the subnet of an
// interface of the netstack, a route the host made for an interface's address goes only with
// the address, a route or neighbour removed must exist. This area reads the host and carries
// out or refuses what passed them.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "hostctl/network/ip.h"

namespace TknCtl::Backend {

// A route of a netstack as the host holds it.
template <class Network, class Address>
struct HostRoute {
    Network network;
    Address gateway;  // unset for a network the interface is on
    std::string interfaceName;
    std::string source;        // where it came from: "MANUAL", "DHCP", ...
    bool connected = false;    // made by the host for an address of the interface
    std::uint32_t metric = 0;  // among routes to one network, the lowest is in force
};
using HostIpv4Route = HostRoute<HostCtl::Network::Ipv4Network, HostCtl::Network::Ipv4Address>;
using HostIpv6Route = HostRoute<HostCtl::Network::Ipv6Network, HostCtl::Network::Ipv6Address>;

class Routing {
public:
    virtual ~Routing();

    // Every operation throws HostCtlException for a netstack the host does not have; this one
    // does nothing else.
    virtual void RequireNetstack(const std::string& netstack) = 0;

    // The routes of the netstack, in the host's order.
    virtual std::vector<HostIpv4Route> Ipv4Routes(const std::string& netstack) = 0;
    virtual std::vector<HostIpv6Route> Ipv6Routes(const std::string& netstack) = 0;
    // Where the route to the network came from (HostRoute::source); empty when the netstack has
    // no route to it. Fast when asked for each route of a listing in turn.
    virtual std::string Ipv4RouteSource(const std::string& netstack,
                                        const HostCtl::Network::Ipv4Network& network) = 0;
    // The interfaces of the netstack on a subnet of which the gateway lies, in the host's order.
    virtual std::vector<std::string> InterfacesReaching(const std::string& netstack,
                                                        const HostCtl::Network::IpAddress& gateway) = 0;
    // Adds the route to the network (host bits cleared) via the gateway through the interface.
    virtual void AddRoute(const std::string& netstack, const HostCtl::Network::Ipv4Network& network,
                          const HostCtl::Network::Ipv4Address& gateway, const std::string& interfaceName) = 0;
    virtual void AddRoute(const std::string& netstack, const HostCtl::Network::Ipv6Network& network,
                          const HostCtl::Network::Ipv6Address& gateway, const std::string& interfaceName) = 0;
    // Removes a route as listed.
    virtual void RemoveRoute(const std::string& netstack, const HostIpv4Route& route) = 0;
    virtual void RemoveRoute(const std::string& netstack, const HostIpv6Route& route) = 0;

    // The neighbours of the netstack, of one interface or of all (empty name), in table order.
    virtual void Neighbors(const std::string& netstack, std::vector<HostCtl::Network::Ipv4Neighbor>& out,
                           const std::string& interfaceName) = 0;
    virtual void Neighbors(const std::string& netstack, std::vector<HostCtl::Network::Ipv6Neighbor>& out,
                           const std::string& interfaceName) = 0;
    // The type of an entry ("Dynamic", "Static", "Router"); throws for an entry the table does
    // not have. Fast when asked for each entry of a listing in turn.
    virtual std::string NeighborType(const std::string& netstack,
                                     const HostCtl::Network::Ipv4Neighbor& entry) = 0;
    virtual std::string NeighborType(const std::string& netstack,
                                     const HostCtl::Network::Ipv6Neighbor& entry) = 0;
    // The text of an IPv6 entry's state.
    virtual std::string NeighborState(const HostCtl::Network::Ipv6Neighbor& entry) = 0;
    // Removes the entries of the address on the entry's interface, or on every interface of the
    // netstack (empty name); throws when there is none.
    virtual void RemoveNeighbor(const std::string& netstack, const HostCtl::Network::Ipv4Neighbor& entry) = 0;
    virtual void RemoveNeighbor(const std::string& netstack, const HostCtl::Network::Ipv6Neighbor& entry) = 0;
};

}  // namespace TknCtl::Backend

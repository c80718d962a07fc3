// Section "routes": the IPv4 and IPv6 routes of each netstack. The default route is an
// entry for 0.0.0.0/0 (::/0); the configured default gateway is kept beside the routes.
#pragma once

#include <string>
#include <vector>

#include "core/section.h"
#include "hostctl/network/types.h"

namespace TknCtl::Model {

struct Ipv4Route {
    HostCtl::Network::Ipv4Network network;
    HostCtl::Network::Ipv4Address gateway;
    std::string interface;  // a Tarkon interface
    std::string source;     // "MANUAL", "DHCP", ...
};

struct Ipv6Route {
    HostCtl::Network::Ipv6Network network;
    HostCtl::Network::Ipv6Address gateway;
    std::string interface;
};

struct StackRoutes {
    std::string netstack;
    std::vector<Ipv4Route> ipv4;
    std::vector<Ipv6Route> ipv6;
    HostCtl::Network::Ipv4Address ipv4ConfigGateway;  // configured default gateway
    HostCtl::Network::Ipv6Address ipv6ConfigGateway;
};

struct RoutesSection {
    static const Lib::SectionKind& Kind();
    std::vector<StackRoutes> stacks;

    const StackRoutes* Find(const std::string& netstack) const;
    StackRoutes* Find(const std::string& netstack);
};

}  // namespace TknCtl::Model

// Routes through rtnetlink: what the kernel says of each (ParseRoute) and the requests that
// add and delete them (BuildRouteRequest), as plain values.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "kernel/netlink.h"

struct nl_msg;
struct nlmsghdr;

namespace TknCtl::Linux::Kernel {

// The main routing table (RT_TABLE_MAIN): the one `ip route` shows.
constexpr unsigned kMainTable = 254;

// Where a route leads: a gateway (empty for a network the device is on) through a device.
struct Nexthop {
    std::string gateway;
    int index = 0;
    bool operator==(const Nexthop&) const = default;
};

struct Route {
    int family = 0;           // AF_INET or AF_INET6
    std::string destination;  // "0.0.0.0" or "::" for the default route
    unsigned prefixLength = 0;
    unsigned table = kMainTable;
    unsigned protocol = 0;          // RTPROT_...: who made it (kernel, boot, static, dhcp, ra, ...)
    unsigned type = 1;              // RTN_... (RTN_UNICAST)
    unsigned scope = 0;             // RT_SCOPE_...
    std::uint32_t metric = 0;       // RTA_PRIORITY
    std::string preferredSource;    // RTA_PREFSRC; empty when none
    std::vector<Nexthop> nexthops;  // one, or those of a multipath route

    bool IsDefault() const { return prefixLength == 0; }
};

// The routes of a namespace (family AF_INET or AF_INET6), in the kernel's order: of one table,
// or of every table (table 0); only the default routes when defaultsOnly is set (the others are
// not read further than their header).
std::vector<Route> ListRoutes(const Namespace& ns, int family, unsigned table = 0, bool defaultsOnly = false);

// A reply message (RTM_NEWROUTE) read into a plain value; nothing when it is no route message
// or a route of the kernel's cache.
std::optional<Route> ParseRoute(const nlmsghdr* message);

// The request that adds (RTM_NEWROUTE, refused when a route of the same destination and metric
// exists) or deletes (RTM_DELROUTE: the route of that destination, metric and next hop) a
// route of one next hop; the caller frees it with nlmsg_free (Request does). Throws
// HostCtlException for a route it cannot express.
nl_msg* BuildRouteRequest(int type, const Route& route);

// The name routes are described by in messages: "10.2.0.0/16 via 10.1.0.2", "default via
// fe80::1", "10.1.0.0/24" (no gateway).
std::string DescribeRoute(const Route& route);

void AddRoute(const Namespace& ns, const Route& route);
void DeleteRoute(const Namespace& ns, const Route& route);

}  // namespace TknCtl::Linux::Kernel

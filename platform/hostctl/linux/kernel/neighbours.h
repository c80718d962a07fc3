// The neighbour tables (ARP, IPv6 neighbour discovery) through rtnetlink: entries and the
// timings of each device's table, read into plain values (ParseNeighbour, ParseNeighbourTiming),
// and the request that deletes an entry (BuildNeighbourDelete).
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "kernel/netlink.h"

struct nl_msg;
struct nlmsghdr;

namespace TknCtl::Linux::Kernel {

struct Neighbour {
    int family = 0;  // AF_INET or AF_INET6
    int index = 0;   // the device's
    std::string address;
    std::string linkLayer;    // empty while unresolved
    std::uint16_t state = 0;  // NUD_...
    std::uint8_t flags = 0;   // NTF_... (NTF_ROUTER: an IPv6 router)
    // Seconds since the entry was last confirmed reachable, used and updated.
    std::uint32_t confirmedAge = 0, usedAge = 0, updatedAge = 0;
};

// The entries of a namespace's table of the family (AF_INET or AF_INET6), in the kernel's order.
std::vector<Neighbour> ListNeighbours(const Namespace& ns, int family);

// A reply message (RTM_NEWNEIGH) read into a plain value; nothing when it is none, or an
// entry of another family (the bridge's forwarding database comes as AF_BRIDGE).
std::optional<Neighbour> ParseNeighbour(const nlmsghdr* message);

// The request that deletes the entry (its family, device and address); the caller frees it
// with nlmsg_free (Request does). Throws HostCtlException for an address not of its family.
nl_msg* BuildNeighbourDelete(const Neighbour& neighbour);
void DeleteNeighbour(const Namespace& ns, const Neighbour& neighbour, const std::string& device);
// The request that adds the entry (its family, device, address, link-layer address, state and
// flags), replacing one of that address; the caller frees it with nlmsg_free (Request does).
// Throws HostCtlException for an address not of its family or a malformed link-layer address.
nl_msg* BuildNeighbourAdd(const Neighbour& neighbour);
void AddNeighbour(const Namespace& ns, const Neighbour& neighbour, const std::string& device);

// How long the entries of a device's table keep each state, in milliseconds.
struct NeighbourTiming {
    int family = 0;
    int index = 0;                     // the device's; 0 for the table's defaults
    std::uint64_t reachableTime = 0;   // reachable after a confirmation (chosen at random around the base)
    std::uint64_t gcStaleTime = 0;     // an unused stale entry may go
    std::uint64_t delayProbeTime = 0;  // delay before the first probe of a stale entry in use
};

// The timings of every device's tables, and the tables' defaults.
std::vector<NeighbourTiming> ListNeighbourTimings(const Namespace& ns);
// A reply message (RTM_NEWNEIGHTBL) read into a plain value; nothing when it holds no timings.
std::optional<NeighbourTiming> ParseNeighbourTiming(const nlmsghdr* message);

}  // namespace TknCtl::Linux::Kernel

// Section "neighbors": the IPv4 (ARP) and IPv6 (neighbour discovery) tables of each netstack.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "core/section.h"
#include "hostctl/network/types.h"

namespace TknCtl::Model {

// IPv6 neighbour states: 0 incomplete, 1 reachable, 2 stale, 3 delay, 4 probe.
inline const char* const kNeighborStateNames[] = {"Incomplete", "Reachable", "Stale", "Delay", "Probe"};

template <class Address>
struct Neighbor {
    Address address;
    std::string mac;           // link-layer address as reported
    std::string interface;     // a Tarkon interface
    std::uint32_t expiry = 0;  // seconds
    std::uint32_t state = 0;
    std::string type = "Dynamic";  // "Dynamic", "Static", ...
};

using Ipv4NeighborEntry = Neighbor<HostCtl::Network::Ipv4Address>;
using Ipv6NeighborEntry = Neighbor<HostCtl::Network::Ipv6Address>;

struct StackNeighbors {
    std::string netstack;
    std::vector<Ipv4NeighborEntry> ipv4;
    std::vector<Ipv6NeighborEntry> ipv6;
};

struct NeighborsSection {
    static const Lib::SectionKind& Kind();
    std::vector<StackNeighbors> stacks;

    const StackNeighbors* Find(const std::string& netstack) const;
    StackNeighbors* Find(const std::string& netstack);
};

}  // namespace TknCtl::Model

// Routes and neighbours of the Linux host's netstacks: the main routing table and the neighbour
// tables of each network namespace.
//
// Routes: every unicast route of the main table, one record per next hop. The source of an
// IPv4 route is "DHCP" for a DHCP client's, "RA" for one a router advertisement brought, the
// routing daemon's name ("BGP", "OSPF", ...) for one a daemon installed, and "MANUAL" for the
// rest (an administrator's, and those the kernel makes for an interface's address). Routes
// this host adds are an administrator's (protocol "static"), of the kernel's default metric.
//
// Neighbours: the entries of the IP interfaces. Their expiry is what is left of the state
// they are in: a reachable entry turns stale once its reachable time after the last
// confirmation is over, an entry in delay is probed once its delay is over, a stale entry may be
// dropped once it has been unused for the table's stale time; other entries (permanent ones
// among them) show 0. Type: "Static" for an entry set by an administrator (permanent) or fixed
// by rule (noarp), "Router" for an IPv6 router, "Dynamic" for the rest. The IPv6 states are
// those of the kernel: 0 "Incomplete", 1 "Reachable", 2 "Stale", 3 "Delay", 4 "Probe",
// 5 "Failed", 6 "Noarp", 7 "Permanent", 8 "None".
#include <linux/neighbour.h>
#include <linux/rtnetlink.h>
#include <sys/socket.h>

#include <algorithm>
#include <cstring>
#include <map>
#include <memory>
#include <unordered_map>

#include "backend/routing.h"
#include "core/context.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "kernel/request.h"
#include "network/areas.h"
#include "network/kernel_view.h"

namespace TknCtl::Linux {

namespace {

using Backend::HostIpv4Route;
using Backend::HostIpv6Route;
using HostCtl::Lib::HostCtlException;
using HostCtl::Network::Ipv4Address;
using HostCtl::Network::Ipv4Neighbor;
using HostCtl::Network::Ipv4Network;
using HostCtl::Network::Ipv6Address;
using HostCtl::Network::Ipv6Neighbor;
using HostCtl::Network::Ipv6Network;

const char* const kStateNames[] = {"Incomplete", "Reachable", "Stale",     "Delay", "Probe",
                                   "Failed",     "Noarp",     "Permanent", "None"};

}  // namespace

// Where a route came from, by the protocol that installed it.
std::string RouteSource(unsigned protocol) {
    switch (protocol) {
        case RTPROT_DHCP:
            return "DHCP";
        case RTPROT_RA:
            return "RA";
        case RTPROT_UNSPEC:
        case RTPROT_REDIRECT:
        case RTPROT_KERNEL:
        case RTPROT_BOOT:
        case RTPROT_STATIC:
            return "MANUAL";
        case RTPROT_GATED:
            return "GATED";
        case RTPROT_MRT:
            return "MRT";
        case RTPROT_ZEBRA:
            return "ZEBRA";
        case RTPROT_BIRD:
            return "BIRD";
        case RTPROT_DNROUTED:
            return "DNROUTED";
        case RTPROT_XORP:
            return "XORP";
        case RTPROT_NTK:
            return "NTK";
        case RTPROT_MROUTED:
            return "MROUTED";
        case RTPROT_KEEPALIVED:
            return "KEEPALIVED";
        case RTPROT_BABEL:
            return "BABEL";
        case RTPROT_OPENR:
            return "OPENR";
        case RTPROT_BGP:
            return "BGP";
        case RTPROT_ISIS:
            return "ISIS";
        case RTPROT_OSPF:
            return "OSPF";
        case RTPROT_RIP:
            return "RIP";
        case RTPROT_EIGRP:
            return "EIGRP";
        default:
            return "PROTOCOL " + std::to_string(protocol);
    }
}

// The IPv6 state number of a kernel state (NUD_...), and the entry's type.
std::uint32_t NeighbourState(std::uint16_t nud) {
    if (nud & NUD_INCOMPLETE) return 0;
    if (nud & NUD_REACHABLE) return 1;
    if (nud & NUD_STALE) return 2;
    if (nud & NUD_DELAY) return 3;
    if (nud & NUD_PROBE) return 4;
    if (nud & NUD_FAILED) return 5;
    if (nud & NUD_NOARP) return 6;
    if (nud & NUD_PERMANENT) return 7;
    return 8;
}

std::string NeighbourType(const Kernel::Neighbour& entry) {
    if (entry.state & (NUD_PERMANENT | NUD_NOARP)) return "Static";
    if (entry.flags & NTF_ROUTER) return "Router";
    return "Dynamic";
}

// Seconds left in the entry's state (see above).
std::uint32_t NeighbourExpiry(const Kernel::Neighbour& entry, const Kernel::NeighbourTiming& timing) {
    auto left = [](std::uint64_t milliseconds, std::uint32_t age) -> std::uint32_t {
        std::uint64_t seconds = milliseconds / 1000;
        return seconds > age ? static_cast<std::uint32_t>(seconds - age) : 0;
    };
    if (entry.state & NUD_REACHABLE) return left(timing.reachableTime, entry.confirmedAge);
    if (entry.state & NUD_DELAY) return left(timing.delayProbeTime, entry.updatedAge);
    if (entry.state & NUD_STALE) return left(timing.gcStaleTime, entry.usedAge);
    return 0;
}

namespace {

// Whether an address of the family lies on the subnet of address/prefix.
bool OnSubnet(int family, const std::string& address, unsigned prefix, const std::string& other) {
    unsigned char a[16], b[16];
    if (!Kernel::AddressBytes(family, address, a) || !Kernel::AddressBytes(family, other, b)) return false;
    unsigned bits = family == AF_INET ? 32 : 128;
    if (prefix > bits) return false;
    for (unsigned i = 0; i < prefix; ++i) {
        unsigned byte = i / 8, bit = 7 - i % 8;
        if (((a[byte] >> bit) & 1) != ((b[byte] >> bit) & 1)) return false;
    }
    return true;
}

std::string Quote(const std::string& text) {
    return Lib::Quote(text);
}

class LinuxRouting final : public Backend::Routing {
public:
    explicit LinuxRouting(Context& context) : context_(context), views_(context) {}

    void RequireNetstack(const std::string& netstack) override { context_.NamespaceOf(netstack); }

    std::vector<HostIpv4Route> Ipv4Routes(const std::string& netstack) override {
        return Routes<HostIpv4Route, Ipv4Network, Ipv4Address>(netstack, AF_INET);
    }

    std::vector<HostIpv6Route> Ipv6Routes(const std::string& netstack) override {
        return Routes<HostIpv6Route, Ipv6Network, Ipv6Address>(netstack, AF_INET6);
    }

    std::string Ipv4RouteSource(const std::string& netstack, const Ipv4Network& network) override {
        auto& view = views_.Of(netstack);
        auto& sources = sources_[view.Netstack()];
        if (sources.generation != Kernel::Generation() || !sources.filled) {
            sources.bySubnet.clear();
            for (const auto& route : view.MainRoutes(AF_INET)) {
                if (route.type != RTN_UNICAST) continue;
                sources.bySubnet.emplace(SubnetKey(Ipv4Address(route.destination), route.prefixLength),
                                         RouteSource(route.protocol));
            }
            sources.generation = Kernel::Generation();
            sources.filled = true;
        }
        auto it = sources.bySubnet.find(SubnetKey(network.GetNetwork(), network.GetPrefixLength()));
        return it == sources.bySubnet.end() ? std::string() : it->second;
    }

    std::vector<std::string> InterfacesReaching(const std::string& netstack,
                                                const HostCtl::Network::IpAddress& gateway) override {
        auto& view = views_.Of(netstack);
        int family = gateway.GetFamily();
        std::string text = gateway.GetStringAddress();
        unsigned host = family == AF_INET ? 32 : 128;
        std::vector<std::string> out;
        for (const auto* link : view.IpInterfaces()) {
            for (const auto& address : view.Addresses()) {
                if (address.index != link->index || address.family != family || address.address == text)
                    continue;
                bool reaches = address.peer.empty()
                                   ? address.prefixLength < host &&
                                         OnSubnet(family, address.address, address.prefixLength, text)
                                   : address.peer == text;
                if (reaches) {
                    out.push_back(link->name);
                    break;
                }
            }
        }
        return out;
    }

    void AddRoute(const std::string& netstack, const Ipv4Network& network, const Ipv4Address& gateway,
                  const std::string& interfaceName) override {
        Add(netstack, AF_INET, network.GetNetwork().GetStringAddress(), network.GetPrefixLength(),
            gateway.GetStringAddress(), interfaceName);
    }

    void AddRoute(const std::string& netstack, const Ipv6Network& network, const Ipv6Address& gateway,
                  const std::string& interfaceName) override {
        Add(netstack, AF_INET6, network.GetNetwork().GetStringAddress(), network.GetNetmask(),
            gateway.GetStringAddress(), interfaceName);
    }

    void RemoveRoute(const std::string& netstack, const HostIpv4Route& route) override {
        Remove(netstack, AF_INET, route.network.GetNetwork().GetStringAddress(),
               route.network.GetPrefixLength(),
               route.gateway.IsUnspecified() ? std::string() : route.gateway.GetStringAddress(),
               route.interfaceName, route.metric);
    }

    void RemoveRoute(const std::string& netstack, const HostIpv6Route& route) override {
        Remove(netstack, AF_INET6, route.network.GetNetwork().GetStringAddress(), route.network.GetNetmask(),
               route.gateway.IsUnspecified() ? std::string() : route.gateway.GetStringAddress(),
               route.interfaceName, route.metric);
    }

    void Neighbors(const std::string& netstack, std::vector<Ipv4Neighbor>& out,
                   const std::string& interfaceName) override {
        Collect(netstack, AF_INET, interfaceName,
                [&](const Kernel::Neighbour& entry, const std::string& name, std::uint32_t expiry) {
                    Ipv4Neighbor n;
                    n.address = Ipv4Address(entry.address);
                    n.linkLayerAddress = entry.linkLayer;
                    n.interfaceName = name;
                    n.expiry = expiry;
                    n.state = 0;
                    out.push_back(std::move(n));
                });
    }

    void Neighbors(const std::string& netstack, std::vector<Ipv6Neighbor>& out,
                   const std::string& interfaceName) override {
        Collect(netstack, AF_INET6, interfaceName,
                [&](const Kernel::Neighbour& entry, const std::string& name, std::uint32_t expiry) {
                    Ipv6Neighbor n;
                    n.address = Ipv6Address(entry.address);
                    n.linkLayerAddress = entry.linkLayer;
                    n.interfaceName = name;
                    n.expiry = expiry;
                    n.state = NeighbourState(entry.state);
                    out.push_back(std::move(n));
                });
    }

    std::string NeighborType(const std::string& netstack, const Ipv4Neighbor& entry) override {
        return TypeOf(netstack, AF_INET, entry.address.GetStringAddress(), entry.interfaceName);
    }

    std::string NeighborType(const std::string& netstack, const Ipv6Neighbor& entry) override {
        return TypeOf(netstack, AF_INET6, entry.address.GetStringAddress(), entry.interfaceName);
    }

    std::string NeighborState(const Ipv6Neighbor& entry) override {
        return entry.state < std::size(kStateNames) ? kStateNames[entry.state] : "Unknown";
    }

    void RemoveNeighbor(const std::string& netstack, const Ipv4Neighbor& entry) override {
        RemoveEntries(netstack, AF_INET, entry.address.GetStringAddress(), entry.interfaceName);
    }

    void RemoveNeighbor(const std::string& netstack, const Ipv6Neighbor& entry) override {
        RemoveEntries(netstack, AF_INET6, entry.address.GetStringAddress(), entry.interfaceName);
    }

private:
    // The unicast routes of a netstack's main table: one record per next hop.
    template <class Route, class Network, class Address>
    std::vector<Route> Routes(const std::string& netstack, int family) {
        std::vector<Route> out;
        auto& view = views_.Of(netstack);
        for (const auto& route : view.MainRoutes(family)) {
            if (route.type != RTN_UNICAST) continue;
            Network network(Address(route.destination), route.prefixLength);
            for (const auto& hop : route.nexthops) {
                Route r;
                r.network = network;
                if (!hop.gateway.empty()) r.gateway = Address(hop.gateway);
                r.interfaceName = view.NameOf(hop.index);
                r.source = RouteSource(route.protocol);
                r.connected = route.protocol == RTPROT_KERNEL;
                r.metric = route.metric;
                out.push_back(std::move(r));
            }
        }
        return out;
    }

    // The index of the IP interface of that name; throws when there is none.
    int IndexOf(NetstackView& view, const std::string& name) {
        const auto* link = view.IpInterface(name);
        if (!link) {
            throw HostCtlException("Tarkon network interface " + Quote(name) +
                                   " does not exist on netstack " + Quote(view.Netstack()));
        }
        return link->index;
    }

    Kernel::Route MakeRoute(int family, const std::string& destination, unsigned prefix,
                            const std::string& gateway, int index) {
        Kernel::Route route;
        route.family = family;
        route.destination = destination;
        route.prefixLength = prefix;
        route.type = RTN_UNICAST;
        route.nexthops.push_back({gateway, index});
        return route;
    }

    // Whether the main table holds a route to destination/prefix via the gateway through index
    // (of that metric when it is not 0).
    bool Holds(NetstackView& view, const Kernel::Route& wanted) {
        for (const auto& route : view.MainRoutes(wanted.family)) {
            if (route.destination != wanted.destination || route.prefixLength != wanted.prefixLength)
                continue;
            if (wanted.metric != 0 && route.metric != wanted.metric) continue;
            for (const auto& hop : route.nexthops) {
                if (hop == wanted.nexthops.front()) return true;
            }
        }
        return false;
    }

    void Add(const std::string& netstack, int family, const std::string& destination, unsigned prefix,
             const std::string& gateway, const std::string& interfaceName) {
        auto& view = views_.Of(netstack);
        Kernel::Route route = MakeRoute(family, destination, prefix, gateway, IndexOf(view, interfaceName));
        route.protocol = RTPROT_STATIC;
        route.scope = RT_SCOPE_UNIVERSE;
        context_.BeginChange();
        Kernel::AddRoute(view.Namespace(), route);
        // (A dry run changed nothing to read back.)
        if (!Kernel::DryRun() && !Holds(view, route)) {
            throw HostCtlException("The kernel does not hold the route " + Kernel::DescribeRoute(route) +
                                   " after adding it");
        }
    }

    void Remove(const std::string& netstack, int family, const std::string& destination, unsigned prefix,
                const std::string& gateway, const std::string& interfaceName, std::uint32_t metric) {
        auto& view = views_.Of(netstack);
        const auto* link = view.LinkByName(interfaceName);
        Kernel::Route route = MakeRoute(family, destination, prefix, gateway, link ? link->index : 0);
        route.metric = metric;
        context_.BeginChange();
        Kernel::DeleteRoute(view.Namespace(), route);
        if (!Kernel::DryRun() && Holds(view, route)) {
            throw HostCtlException("The kernel still holds the route " + Kernel::DescribeRoute(route) +
                                   " after removing it");
        }
    }

    template <class Make>
    void Collect(const std::string& netstack, int family, const std::string& interfaceName, Make make) {
        auto& view = views_.Of(netstack);
        // An interface of another netstack has no entries in this one.
        const auto* link = interfaceName.empty() ? nullptr : view.IpInterface(interfaceName);
        if (!interfaceName.empty() && !link) return;
        int only = link ? link->index : 0;
        for (const auto& entry : view.Neighbours(family)) {
            if (only != 0 && entry.index != only) continue;
            // As `ip neigh` lists them: the kernel's own entries for multicast and broadcast
            // addresses (NOARP) and entries that hold nothing (NONE) are no neighbours.
            if (!(entry.state & (0xFF & ~NUD_NOARP))) continue;
            const auto* link = view.LinkByIndex(entry.index);
            if (!link || !IsIpInterface(*link, view.Links())) continue;
            make(entry, link->name, NeighbourExpiry(entry, view.TimingOf(family, entry.index)));
        }
    }

    std::string TypeOf(const std::string& netstack, int family, const std::string& address,
                       const std::string& interfaceName) {
        auto& view = views_.Of(netstack);
        auto& types = types_[view.Netstack()];
        if (types.generation != Kernel::Generation() || !types.filled) {
            types.byEntry.clear();
            for (int f : {AF_INET, AF_INET6}) {
                for (const auto& entry : view.Neighbours(f))
                    types.byEntry.emplace(Key(f, view.NameOf(entry.index), entry.address),
                                          NeighbourType(entry));
            }
            types.generation = Kernel::Generation();
            types.filled = true;
        }
        auto it = types.byEntry.find(Key(family, interfaceName, address));
        if (it == types.byEntry.end()) {
            throw HostCtlException("Netstack " + Quote(view.Netstack()) + " has no neighbour " + address +
                                   " on " + interfaceName);
        }
        return it->second;
    }

    static std::uint64_t SubnetKey(const Ipv4Address& network, unsigned prefix) {
        return (std::uint64_t(network.GetHostOrder()) << 8) | prefix;
    }

    static std::string Key(int family, const std::string& name, const std::string& address) {
        return std::to_string(family) + " " + name + " " + address;
    }

    void RemoveEntries(const std::string& netstack, int family, const std::string& address,
                       const std::string& interfaceName) {
        auto& view = views_.Of(netstack);
        const auto* link = interfaceName.empty() ? nullptr : view.IpInterface(interfaceName);
        int only = link ? link->index : -1;  // an interface of another netstack: none of this one's
        if (interfaceName.empty()) only = 0;
        std::vector<std::pair<Kernel::Neighbour, std::string>> matches;
        for (const auto& entry : view.Neighbours(family)) {
            if (entry.address != address || (only != 0 && entry.index != only)) continue;
            const auto* link = view.LinkByIndex(entry.index);
            if (link && IsIpInterface(*link, view.Links())) matches.emplace_back(entry, link->name);
        }
        if (matches.empty()) {
            throw HostCtlException(
                "No neighbour entry for " + address +
                (interfaceName.empty() ? " on netstack " + Quote(view.Netstack()) : " on " + interfaceName));
        }
        context_.BeginChange();
        for (const auto& [entry, name] : matches)
            Kernel::DeleteNeighbour(view.Namespace(), entry, name);
        if (Kernel::DryRun()) return;
        // Traffic may ask for the address again at once: an entry still resolving is no leftover.
        for (const auto& entry : view.Neighbours(family)) {
            if (entry.address != address || (only != 0 && entry.index != only)) continue;
            bool matched = std::any_of(matches.begin(), matches.end(),
                                       [&](const auto& m) { return m.first.index == entry.index; });
            if (matched && !(entry.state & (NUD_INCOMPLETE | NUD_FAILED | NUD_NONE))) {
                throw HostCtlException("The kernel still holds the neighbour entry of " + address + " on " +
                                       view.NameOf(entry.index) + " after removing it");
            }
        }
    }

    struct Sources {
        unsigned long generation = 0;
        bool filled = false;
        std::unordered_map<std::uint64_t, std::string> bySubnet;
    };
    struct Types {
        unsigned long generation = 0;
        bool filled = false;
        std::unordered_map<std::string, std::string> byEntry;
    };

    Context& context_;
    KernelViews views_;
    std::map<std::string, Sources> sources_;
    std::map<std::string, Types> types_;
};

}  // namespace

std::unique_ptr<Backend::Routing> MakeRouting(Context& context) {
    return std::make_unique<LinuxRouting>(context);
}

}  // namespace TknCtl::Linux

// Routes, default gateways and neighbours of the Tarkon netstacks.
#include <algorithm>

#include "backend/host.h"
#include "backend/routing.h"
#include "core/hook.h"
#include "core/section.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "hostctl/network/ip.h"
#include "model/ipsettings.h"
#include "model/neighbors.h"
#include "model/netstacks.h"
#include "model/routes.h"
#include "model/tknnics.h"
#include "network/ip_internal.h"

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;
using HostCtl::Network::Ipv4Address;
using HostCtl::Network::Ipv4Network;
using HostCtl::Network::Ipv6Address;
using HostCtl::Network::Ipv6Network;

const Ipv4Network RoutingInfoImpl::DEFAULT_IPV4_ROUTE{};
const Ipv6Network RoutingInfoImpl::DEFAULT_IPV6_ROUTE{};

namespace {

void RequireNetstack(const std::string& netstack) {
    if (!Lib::Read<Model::NetstacksSection>().Find(netstack))
        throw HostCtlException("Netstack instance " + Lib::Quote(netstack) + " does not exist");
}

// The routes section entry of a netstack, made when it has none.
Model::StackRoutes& WritableStack(const std::string& netstack) {
    auto& routes = Lib::Write<Model::RoutesSection>();
    if (auto* stack = routes.Find(netstack)) return *stack;
    routes.stacks.push_back({});
    routes.stacks.back().netstack = netstack;
    return routes.stacks.back();
}

Ipv4Network Normal(const Ipv4Network& n) {
    return Ipv4Network(n.GetNetwork(), n.GetPrefixLength());
}
Ipv6Network Normal(const Ipv6Network& n) {
    return Ipv6Network(n.GetNetwork(), n.GetNetmask());
}

std::string Text(const Ipv4Network& n) {
    return n.GetStringAddress();
}
std::string Text(const Ipv6Network& n) {
    return n.GetStringAddress();
}

// Whether the gateway lies in a subnet of the interface (and is not its own address).
bool Reaches(const Model::TknNic& nic, const Ipv4Address& gateway) {
    const auto& c = nic.ipConfig;
    if (c.GetIpv4Address().IsUnspecified() || c.GetIpv4Netmask().IsUnspecified()) return false;
    unsigned prefix = 0;
    for (auto bits = c.GetIpv4Netmask().GetHostOrder(); bits & 0x80000000u; bits <<= 1)
        ++prefix;
    return gateway != c.GetIpv4Address() && Ipv4Network(c.GetIpv4Address(), prefix).Contains(gateway);
}

bool Reaches(const Model::TknNic& nic, const Ipv6Address& gateway) {
    if (!nic.ipConfig.GetUseIpv6()) return false;
    const auto& networks = nic.ipConfig.GetIpv6Network();
    return std::any_of(networks.begin(), networks.end(), [&](const Ipv6Network& n) {
        return n.GetNetmask() < 128 && gateway != n.GetAddress() && n.Contains(gateway);
    });
}

// The first interface of the netstack that reaches the gateway; empty when none does.
template <class Address>
std::string InterfaceReaching(const std::string& netstack, const Address& gateway) {
    for (const auto& nic : Lib::Read<Model::TknNicsSection>().nics) {
        if (nic.netstack == netstack && Reaches(nic, gateway)) return nic.name;
    }
    return {};
}

template <class Address>
std::string RequireReachable(const std::string& netstack, const Address& gateway) {
    if (gateway.IsUnspecified()) throw HostCtlException("A route needs a gateway address");
    std::string nic = InterfaceReaching(netstack, gateway);
    if (nic.empty()) {
        throw HostCtlException("Gateway " + gateway.GetStringAddress() +
                               " is unreachable: no Tarkon interface of " + "netstack " +
                               Lib::Quote(netstack) + " is on its subnet");
    }
    return nic;
}

template <class Route>
std::string Via(const Route& route) {
    return route.gateway.IsUnspecified() ? "on " + route.interface : "via " + route.gateway.GetStringAddress();
}

std::vector<Model::Ipv4Route>& Routes(Model::StackRoutes& stack, const Ipv4Network*) {
    return stack.ipv4;
}
std::vector<Model::Ipv6Route>& Routes(Model::StackRoutes& stack, const Ipv6Network*) {
    return stack.ipv6;
}
const std::vector<Model::Ipv4Route>& Routes(const Model::StackRoutes& stack, const Ipv4Network*) {
    return stack.ipv4;
}
const std::vector<Model::Ipv6Route>& Routes(const Model::StackRoutes& stack, const Ipv6Network*) {
    return stack.ipv6;
}
Ipv4Address& ConfigGateway(Model::StackRoutes& stack, const Ipv4Network*) {
    return stack.ipv4ConfigGateway;
}
Ipv6Address& ConfigGateway(Model::StackRoutes& stack, const Ipv6Network*) {
    return stack.ipv6ConfigGateway;
}

Model::Ipv4Route MakeRoute(const Ipv4Network& n, const Ipv4Address& g, std::string nic,
                           bool fromDhcp = false) {
    return {n, g, std::move(nic), fromDhcp ? "DHCP" : "MANUAL"};
}
Model::Ipv6Route MakeRoute(const Ipv6Network& n, const Ipv6Address& g, std::string nic, bool = false) {
    return {n, g, std::move(nic)};
}

template <class Network, class Address>
void AddRoute(const std::string& netstack, const Network& given, const Address& gateway) {
    RequireNetstack(netstack);
    const Network network = Normal(given);
    const Network* tag = nullptr;
    if (const auto* stack = Lib::Read<Model::RoutesSection>().Find(netstack)) {
        for (const auto& route : Routes(*stack, tag)) {
            if (route.network == network) {
                throw HostCtlException("A route to " + Text(network) + " already exists on netstack " +
                                       Lib::Quote(netstack) + " (" + Via(route) + ")");
            }
        }
    }
    std::string nic = RequireReachable(netstack, gateway);
    auto& stack = WritableStack(netstack);
    auto& routes = Routes(stack, tag);
    if (network == Network()) {
        routes.insert(routes.begin(), MakeRoute(network, gateway, nic));
        ConfigGateway(stack, tag) = gateway;
    } else {
        routes.push_back(MakeRoute(network, gateway, nic));
    }
}

template <class Network, class Address>
void RemoveRoute(const std::string& netstack, const Network& given, const Address& gateway) {
    RequireNetstack(netstack);
    const Network network = Normal(given);
    const Network* tag = nullptr;
    const auto* stack = Lib::Read<Model::RoutesSection>().Find(netstack);
    std::size_t index = 0;
    bool found = false;
    if (stack) {
        const auto& routes = Routes(*stack, tag);
        for (; index < routes.size(); ++index) {
            if (routes[index].network == network && routes[index].gateway == gateway) {
                found = true;
                break;
            }
        }
    }
    if (!found) {
        throw HostCtlException("Netstack " + Lib::Quote(netstack) + " has no route to " + Text(network) +
                               " via " + gateway.GetStringAddress());
    }
    const auto& route = Routes(*stack, tag)[index];
    if (route.gateway.IsUnspecified()) {
        throw HostCtlException("The route to " + Text(network) + " belongs to the address of " +
                               route.interface + " and goes only with it");
    }
    auto& writable = WritableStack(netstack);
    auto& routes = Routes(writable, tag);
    routes.erase(routes.begin() + static_cast<std::ptrdiff_t>(index));
    if (network == Network()) ConfigGateway(writable, tag) = Address();
}

template <class Network, class Address>
Address DefaultGateway(const std::string& netstack) {
    RequireNetstack(netstack);
    const Network* tag = nullptr;
    if (const auto* stack = Lib::Read<Model::RoutesSection>().Find(netstack)) {
        for (const auto& route : Routes(*stack, tag)) {
            if (route.network == Network()) return route.gateway;
        }
    }
    return Address();
}

template <class Network, class Address>
void SetDefaultGateway(const std::string& netstack, const Address& gateway, bool fromDhcp) {
    RequireNetstack(netstack);
    const Network* tag = nullptr;
    std::string nic;
    if (!gateway.IsUnspecified()) nic = RequireReachable(netstack, gateway);
    auto& stack = WritableStack(netstack);
    auto& routes = Routes(stack, tag);
    auto current =
        std::find_if(routes.begin(), routes.end(), [](const auto& r) { return r.network == Network(); });
    if (gateway.IsUnspecified()) {
        if (current != routes.end()) routes.erase(current);
    } else if (current != routes.end()) {
        *current = MakeRoute(Network(), gateway, nic, fromDhcp);
    } else {
        routes.insert(routes.begin(), MakeRoute(Network(), gateway, nic, fromDhcp));
    }
    ConfigGateway(stack, tag) = gateway;
}

bool Ipv6On() {
    return Lib::Read<Model::IpSettingsSection>().ipv6Enabled;
}

template <class Entry, class Neighbor>
Neighbor ToNeighbor(const Entry& e) {
    Neighbor n;
    n.address = e.address;
    n.linkLayerAddress = e.mac;
    n.interfaceName = e.interface;
    n.expiry = e.expiry;
    n.state = e.state;
    return n;
}

std::vector<Model::Ipv4NeighborEntry>& Table(Model::StackNeighbors& s, const Ipv4Address*) {
    return s.ipv4;
}
std::vector<Model::Ipv6NeighborEntry>& Table(Model::StackNeighbors& s, const Ipv6Address*) {
    return s.ipv6;
}
const std::vector<Model::Ipv4NeighborEntry>& Table(const Model::StackNeighbors& s, const Ipv4Address*) {
    return s.ipv4;
}
const std::vector<Model::Ipv6NeighborEntry>& Table(const Model::StackNeighbors& s, const Ipv6Address*) {
    return s.ipv6;
}

template <class Neighbor>
void GetNeighbors(const std::string& netstack, std::vector<Neighbor>& out, const std::string& nic) {
    RequireNetstack(netstack);
    const decltype(Neighbor::address)* tag = nullptr;
    const auto* stack = Lib::Read<Model::NeighborsSection>().Find(netstack);
    if (!stack) return;
    for (const auto& e : Table(*stack, tag)) {
        if (nic.empty() || e.interface == nic)
            out.push_back(ToNeighbor<std::decay_t<decltype(e)>, Neighbor>(e));
    }
}

template <class Neighbor>
std::string NeighborType(const std::string& netstack, const Neighbor& neighbor) {
    RequireNetstack(netstack);
    const decltype(Neighbor::address)* tag = nullptr;
    if (const auto* stack = Lib::Read<Model::NeighborsSection>().Find(netstack)) {
        const auto& table = Table(*stack, tag);
        auto matches = [&](const auto& e) {
            return e.address == neighbor.address && e.interface == neighbor.interfaceName;
        };
        // A listing asks for the type of every neighbour in table order: the entry after the
        // last one found comes first, so that a table of thousands is not searched once per
        // entry. The search from the start still answers any other order.
        static std::size_t next = 0;
        if (next < table.size() && matches(table[next])) return table[next++].type;
        for (std::size_t i = 0; i < table.size(); ++i) {
            if (matches(table[i])) {
                next = i + 1;
                return table[i].type;
            }
        }
    }
    throw HostCtlException("Netstack " + Lib::Quote(netstack) + " has no neighbour " +
                           neighbor.address.GetStringAddress() + " on " + neighbor.interfaceName);
}

template <class Neighbor>
void RemoveNeighbor(const std::string& netstack, const Neighbor& neighbor) {
    RequireNetstack(netstack);
    const decltype(Neighbor::address)* tag = nullptr;
    auto matches = [&](const auto& e) {
        return e.address == neighbor.address &&
               (neighbor.interfaceName.empty() || e.interface == neighbor.interfaceName);
    };
    const auto* stack = Lib::Read<Model::NeighborsSection>().Find(netstack);
    if (!stack || std::none_of(Table(*stack, tag).begin(), Table(*stack, tag).end(), matches)) {
        throw HostCtlException("No neighbour entry for " + neighbor.address.GetStringAddress() +
                               (neighbor.interfaceName.empty() ? " on netstack " + Lib::Quote(netstack)
                                                               : " on " + neighbor.interfaceName));
    }
    std::erase_if(Table(*Lib::Write<Model::NeighborsSection>().Find(netstack), tag), matches);
}

// ---------------------------------------------------------------- a real host

// The routing area of the real host the session manages, or nullptr on the simulated host.
Backend::Routing* RealRouting() {
    auto* host = Lib::RealHost();
    return host ? &host->GetRouting() : nullptr;
}

bool IsLinkLocal(const Ipv4Address&) {
    return false;
}
bool IsLinkLocal(const Ipv6Address& address) {
    return address.IsLinkLocal();
}

template <class Route>
std::string ViaText(const Route& route) {
    return route.gateway.IsUnspecified() ? "on " + route.interfaceName
                                         : "via " + route.gateway.GetStringAddress();
}

std::vector<Backend::HostIpv4Route> HostRoutes(Backend::Routing& area, const std::string& netstack,
                                               const Ipv4Network*) {
    return area.Ipv4Routes(netstack);
}
std::vector<Backend::HostIpv6Route> HostRoutes(Backend::Routing& area, const std::string& netstack,
                                               const Ipv6Network*) {
    return area.Ipv6Routes(netstack);
}

// The interface a route via the gateway goes through: the first of the netstack on whose
// subnet the gateway lies. A link-local gateway lies on every link: it is taken only when one
// interface alone reaches it.
template <class Address>
std::string RealReaching(Backend::Routing& area, const std::string& netstack, const Address& gateway) {
    if (gateway.IsUnspecified()) throw HostCtlException("A route needs a gateway address");
    auto nics = area.InterfacesReaching(netstack, gateway);
    if (nics.empty()) {
        throw HostCtlException("Gateway " + gateway.GetStringAddress() +
                               " is unreachable: no Tarkon interface of netstack " + Lib::Quote(netstack) +
                               " is on its subnet");
    }
    if (IsLinkLocal(gateway) && nics.size() > 1) {
        std::string names;
        for (const auto& nic : nics)
            names += (names.empty() ? "" : ", ") + nic;
        throw HostCtlException("Gateway " + gateway.GetStringAddress() +
                               " is a link-local address, on the link of each of " + names +
                               ": give an address of the gateway on a subnet of one of them");
    }
    return nics.front();
}

template <class Network, class Address>
void RealAddRoute(Backend::Routing& area, const std::string& netstack, const Network& given,
                  const Address& gateway) {
    const Network network = Normal(given);
    const Network* tag = nullptr;
    for (const auto& route : HostRoutes(area, netstack, tag)) {
        if (Normal(route.network) == network) {
            throw HostCtlException("A route to " + Text(network) + " already exists on netstack " +
                                   Lib::Quote(netstack) + " (" + ViaText(route) + ")");
        }
    }
    area.AddRoute(netstack, network, gateway, RealReaching(area, netstack, gateway));
}

template <class Network, class Address>
void RealRemoveRoute(Backend::Routing& area, const std::string& netstack, const Network& given,
                     const Address& gateway) {
    const Network network = Normal(given);
    const Network* tag = nullptr;
    auto routes = HostRoutes(area, netstack, tag);
    auto route = std::find_if(routes.begin(), routes.end(), [&](const auto& r) {
        return Normal(r.network) == network && r.gateway == gateway;
    });
    if (route == routes.end()) {
        throw HostCtlException("Netstack " + Lib::Quote(netstack) + " has no route to " + Text(network) +
                               " via " + gateway.GetStringAddress());
    }
    if (route->connected) {
        throw HostCtlException("The route to " + Text(network) + " belongs to the address of " +
                               route->interfaceName + " and goes only with it");
    }
    area.RemoveRoute(netstack, *route);
}

bool IsDefault(const Backend::HostIpv4Route& route) {
    return route.network.GetPrefixLength() == 0;
}
bool IsDefault(const Backend::HostIpv6Route& route) {
    return route.network.GetNetmask() == 0;
}

// The default route in force: of the default routes, the one of the lowest metric (the first
// of those when several share it); nullptr when there is none.
template <class Route>
const Route* DefaultInForce(const std::vector<Route>& routes) {
    const Route* best = nullptr;
    for (const auto& route : routes) {
        if (IsDefault(route) && (!best || route.metric < best->metric)) best = &route;
    }
    return best;
}

template <class Network, class Address>
Address RealDefaultGateway(Backend::Routing& area, const std::string& netstack) {
    const Network* tag = nullptr;
    auto routes = HostRoutes(area, netstack, tag);
    const auto* route = DefaultInForce(routes);
    return route ? route->gateway : Address();
}

// Replaces the default route in force with one via the gateway (the unset address only takes
// it away). When the new route is refused the old one is put back.
template <class Network, class Address>
void RealSetDefaultGateway(Backend::Routing& area, const std::string& netstack, const Address& gateway) {
    const Network* tag = nullptr;
    auto routes = HostRoutes(area, netstack, tag);
    const auto* current = DefaultInForce(routes);
    if (gateway.IsUnspecified()) {
        if (current) area.RemoveRoute(netstack, *current);
        return;
    }
    std::string nic = RealReaching(area, netstack, gateway);
    if (current && current->gateway == gateway && current->interfaceName == nic) return;
    if (current) area.RemoveRoute(netstack, *current);
    try {
        area.AddRoute(netstack, Network(), gateway, nic);
    } catch (const HostCtlException&) {
        if (current && !current->gateway.IsUnspecified()) {
            try {
                area.AddRoute(netstack, Network(), current->gateway, current->interfaceName);
            } catch (const HostCtlException&) {
                // The refusal of the new route is what the caller learns.
            }
        }
        throw;
    }
}

}  // namespace

RoutingInfoImpl::RoutingInfoImpl(const std::string& netstack) : netstack_(netstack) {}
RoutingInfoImpl::~RoutingInfoImpl() = default;

void RoutingInfoImpl::SetNetstackInstanceKey(const std::string& netstack) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::SetNetstackInstanceKey", netstack);
    if (auto* area = RealRouting()) {
        area->RequireNetstack(netstack);
    } else {
        RequireNetstack(netstack);
    }
    netstack_ = netstack;
}

std::vector<HostCtl::Network::Ipv4Route> RoutingInfoImpl::GetCurrentTarkonRoutes() {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::GetCurrentTarkonRoutes", netstack_);
    std::vector<HostCtl::Network::Ipv4Route> out;
    if (auto* area = RealRouting()) {
        for (auto& r : area->Ipv4Routes(netstack_))
            out.push_back({r.network, r.gateway, std::move(r.interfaceName)});
        return out;
    }
    RequireNetstack(netstack_);
    if (const auto* stack = Lib::Read<Model::RoutesSection>().Find(netstack_)) {
        for (const auto& r : stack->ipv4)
            out.push_back({r.network, r.gateway, r.interface});
    }
    return out;
}

std::vector<HostCtl::Network::Ipv6Route> RoutingInfoImpl::GetCurrentIpv6TarkonRoutes() {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::GetCurrentIpv6TarkonRoutes", netstack_);
    std::vector<HostCtl::Network::Ipv6Route> out;
    if (auto* area = RealRouting()) {
        for (auto& r : area->Ipv6Routes(netstack_))
            out.push_back({r.network, r.gateway, std::move(r.interfaceName)});
        return out;
    }
    RequireNetstack(netstack_);
    if (const auto* stack = Lib::Read<Model::RoutesSection>().Find(netstack_)) {
        for (const auto& r : stack->ipv6)
            out.push_back({r.network, r.gateway, r.interface});
    }
    return out;
}

void RoutingInfoImpl::AddTarkonRoute(const Ipv4Network& network, const Ipv4Address& gateway) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::AddTarkonRoute", netstack_,
               Lib::Args(network.GetStringAddress(), gateway.GetStringAddress()));
    if (auto* area = RealRouting()) return RealAddRoute(*area, netstack_, network, gateway);
    AddRoute(netstack_, network, gateway);
}

void RoutingInfoImpl::AddIpv6TarkonRoute(const Ipv6Network& network, const Ipv6Address& gateway) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::AddIpv6TarkonRoute", netstack_,
               Lib::Args(network.GetStringAddress(), gateway.GetStringAddress()));
    if (auto* area = RealRouting()) return RealAddRoute(*area, netstack_, network, gateway);
    AddRoute(netstack_, network, gateway);
}

void RoutingInfoImpl::RemoveTarkonRoute(const Ipv4Network& network, const Ipv4Address& gateway) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::RemoveTarkonRoute", netstack_,
               Lib::Args(network.GetStringAddress(), gateway.GetStringAddress()));
    if (auto* area = RealRouting()) return RealRemoveRoute(*area, netstack_, network, gateway);
    RemoveRoute(netstack_, network, gateway);
}

void RoutingInfoImpl::RemoveIpv6TarkonRoute(const Ipv6Network& network, const Ipv6Address& gateway) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::RemoveIpv6TarkonRoute", netstack_,
               Lib::Args(network.GetStringAddress(), gateway.GetStringAddress()));
    if (auto* area = RealRouting()) return RealRemoveRoute(*area, netstack_, network, gateway);
    RemoveRoute(netstack_, network, gateway);
}

std::string RoutingInfoImpl::GetDefaultGatewaySource(const Ipv4Network& network) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::GetDefaultGatewaySource", netstack_,
               network.GetStringAddress());
    Ipv4Network wanted = Normal(network);
    if (auto* area = RealRouting()) {
        std::string source = area->Ipv4RouteSource(netstack_, wanted);
        if (!source.empty()) return source;
        throw HostCtlException("Netstack " + Lib::Quote(netstack_) + " has no route to " +
                               wanted.GetStringAddress());
    }
    RequireNetstack(netstack_);
    if (const auto* stack = Lib::Read<Model::RoutesSection>().Find(netstack_)) {
        for (const auto& r : stack->ipv4) {
            if (r.network == wanted) return r.source;
        }
    }
    throw HostCtlException("Netstack " + Lib::Quote(netstack_) + " has no route to " +
                           wanted.GetStringAddress());
}

Ipv4Address RoutingInfoImpl::GetTarkonDefaultGateway() {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::GetTarkonDefaultGateway", netstack_);
    if (auto* area = RealRouting()) return RealDefaultGateway<Ipv4Network, Ipv4Address>(*area, netstack_);
    return DefaultGateway<Ipv4Network, Ipv4Address>(netstack_);
}

Ipv6Address RoutingInfoImpl::GetIpv6TarkonDefaultGateway() {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::GetIpv6TarkonDefaultGateway", netstack_);
    if (auto* area = RealRouting()) return RealDefaultGateway<Ipv6Network, Ipv6Address>(*area, netstack_);
    return DefaultGateway<Ipv6Network, Ipv6Address>(netstack_);
}

Ipv4Address RoutingInfoImpl::GetTarkonConfigDefaultGateway() {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::GetTarkonConfigDefaultGateway", netstack_);
    // A real host keeps no default gateway apart from its default route.
    if (auto* area = RealRouting()) return RealDefaultGateway<Ipv4Network, Ipv4Address>(*area, netstack_);
    RequireNetstack(netstack_);
    const auto* stack = Lib::Read<Model::RoutesSection>().Find(netstack_);
    return stack ? stack->ipv4ConfigGateway : Ipv4Address();
}

Ipv6Address RoutingInfoImpl::GetIpv6TarkonConfigDefaultGateway() {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::GetIpv6TarkonConfigDefaultGateway", netstack_);
    if (auto* area = RealRouting()) return RealDefaultGateway<Ipv6Network, Ipv6Address>(*area, netstack_);
    RequireNetstack(netstack_);
    const auto* stack = Lib::Read<Model::RoutesSection>().Find(netstack_);
    return stack ? stack->ipv6ConfigGateway : Ipv6Address();
}

void RoutingInfoImpl::SetTarkonDefaultGateway(const Ipv4Address& gateway, bool fromDhcp) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::SetTarkonDefaultGateway", netstack_,
               Lib::Args(gateway.GetStringAddress(), fromDhcp));
    if (auto* area = RealRouting()) {
        if (fromDhcp) {
            throw HostCtlException("A gateway learned by DHCP comes from the DHCP client of the " +
                                   Lib::RealHost()->Describe() + "; it cannot be set");
        }
        return RealSetDefaultGateway<Ipv4Network>(*area, netstack_, gateway);
    }
    SetDefaultGateway<Ipv4Network>(netstack_, gateway, fromDhcp);
}

void RoutingInfoImpl::SetIpv6TarkonDefaultGateway(const Ipv6Address& gateway) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::SetIpv6TarkonDefaultGateway", netstack_,
               gateway.GetStringAddress());
    if (auto* area = RealRouting()) return RealSetDefaultGateway<Ipv6Network>(*area, netstack_, gateway);
    SetDefaultGateway<Ipv6Network>(netstack_, gateway, false);
}

void RoutingInfoImpl::GetCurrentIpv4TarkonNeighbors(std::vector<HostCtl::Network::Ipv4Neighbor>& out,
                                                    const std::string& interfaceName) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::GetCurrentIpv4TarkonNeighbors", netstack_, interfaceName);
    if (auto* area = RealRouting()) return area->Neighbors(netstack_, out, interfaceName);
    GetNeighbors(netstack_, out, interfaceName);
}

void RoutingInfoImpl::GetCurrentIpv6TarkonNeighbors(std::vector<HostCtl::Network::Ipv6Neighbor>& out,
                                                    const std::string& interfaceName) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::GetCurrentIpv6TarkonNeighbors", netstack_, interfaceName);
    if (auto* area = RealRouting()) return area->Neighbors(netstack_, out, interfaceName);
    RequireNetstack(netstack_);
    if (Ipv6On()) GetNeighbors(netstack_, out, interfaceName);
}

std::string RoutingInfoImpl::GetIpv4NeighborType(const HostCtl::Network::Ipv4Neighbor& neighbor) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::GetIpv4NeighborType", netstack_,
               Lib::Args(neighbor.address.GetStringAddress(), neighbor.interfaceName));
    if (auto* area = RealRouting()) return area->NeighborType(netstack_, neighbor);
    return NeighborType(netstack_, neighbor);
}

std::string RoutingInfoImpl::GetIpv6NeighborType(const HostCtl::Network::Ipv6Neighbor& neighbor) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::GetIpv6NeighborType", netstack_,
               Lib::Args(neighbor.address.GetStringAddress(), neighbor.interfaceName));
    if (auto* area = RealRouting()) return area->NeighborType(netstack_, neighbor);
    return NeighborType(netstack_, neighbor);
}

std::string RoutingInfoImpl::GetIpv6NeighborState(const HostCtl::Network::Ipv6Neighbor& neighbor) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::GetIpv6NeighborState", netstack_,
               Lib::Args(neighbor.address.GetStringAddress(), neighbor.interfaceName));
    if (auto* area = RealRouting()) return area->NeighborState(neighbor);
    return neighbor.state < std::size(Model::kNeighborStateNames) ? Model::kNeighborStateNames[neighbor.state]
                                                                  : "Unknown";
}

void RoutingInfoImpl::RemoveIpv4Neighbor(const HostCtl::Network::Ipv4Neighbor& neighbor) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::RemoveIpv4Neighbor", netstack_,
               Lib::Args(neighbor.address.GetStringAddress(), neighbor.interfaceName));
    if (auto* area = RealRouting()) return area->RemoveNeighbor(netstack_, neighbor);
    RemoveNeighbor(netstack_, neighbor);
}

void RoutingInfoImpl::RemoveIpv6Neighbor(const HostCtl::Network::Ipv6Neighbor& neighbor) {
    Lib::Enter("TknCtl::Network::RoutingInfoImpl::RemoveIpv6Neighbor", netstack_,
               Lib::Args(neighbor.address.GetStringAddress(), neighbor.interfaceName));
    if (auto* area = RealRouting()) return area->RemoveNeighbor(netstack_, neighbor);
    RemoveNeighbor(netstack_, neighbor);
}

// ---------------------------------------------------------------- consistency with interfaces

namespace Internal {

namespace {

template <class Network, class Address>
void SyncFamily(Model::StackRoutes& stack, const std::string& netstack, bool& changed) {
    const Network* tag = nullptr;
    auto& routes = Routes(stack, tag);
    for (auto it = routes.begin(); it != routes.end();) {
        const auto* nic = Lib::Read<Model::TknNicsSection>().Find(it->interface);
        if (it->gateway.IsUnspecified() || (nic && Reaches(*nic, it->gateway))) {
            ++it;
            continue;
        }
        changed = true;
        std::string other = InterfaceReaching(netstack, it->gateway);
        if (other.empty()) {
            it = routes.erase(it);
        } else {
            (it++)->interface = other;
        }
    }
    const Address& gateway = ConfigGateway(stack, tag);
    bool hasDefault =
        std::any_of(routes.begin(), routes.end(), [](const auto& r) { return r.network == Network(); });
    if (!gateway.IsUnspecified() && !hasDefault) {
        std::string nic = InterfaceReaching(netstack, gateway);
        if (!nic.empty()) {
            routes.insert(routes.begin(), MakeRoute(Network(), gateway, nic));
            changed = true;
        }
    }
}

}  // namespace

void SyncGatewayRoutes(const std::string& netstack) {
    const auto* current = Lib::Read<Model::RoutesSection>().Find(netstack);
    if (!current) return;
    // Work on a copy so that an unchanged section is not written.
    Model::StackRoutes stack = *current;
    bool changed = false;
    SyncFamily<Ipv4Network, Ipv4Address>(stack, netstack, changed);
    SyncFamily<Ipv6Network, Ipv6Address>(stack, netstack, changed);
    if (changed) *Lib::Write<Model::RoutesSection>().Find(netstack) = std::move(stack);
}

}  // namespace Internal
}  // namespace TknCtl::Network

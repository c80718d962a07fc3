// What the host does around a Tarkon interface: the rules of its IP configuration, the state
// derived from it (addresses the host adds, the address its port carries, connected routes),
// and the clean-up when the interface goes away.
#include <algorithm>
#include <cstring>

#include "core/section.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "model/dvswitches.h"
#include "model/multicast.h"
#include "model/neighbors.h"
#include "model/ports.h"
#include "model/routes.h"
#include "model/vswitches.h"
#include "network/ip_internal.h"
#include "network/tknnic_internal.h"

namespace TknCtl::Network::Internal {

using HostCtl::Lib::HostCtlException;
using HostCtl::Network::IpConfig;
using HostCtl::Network::Ipv4Address;
using HostCtl::Network::Ipv4Network;
using HostCtl::Network::Ipv6Address;
using HostCtl::Network::Ipv6Network;

namespace {

// ---------------------------------------------------------------- IPv4

unsigned PrefixLength(const Ipv4Address& netmask) {
    unsigned length = 0;
    for (std::uint32_t bits = netmask.GetHostOrder(); bits & 0x80000000u; bits <<= 1)
        ++length;
    return length;
}

// Why address cannot be an interface's address, or nothing.
const char* NotAHostAddress(const Ipv4Address& address) {
    std::uint32_t a = address.GetHostOrder();
    if ((a >> 24) == 0) return "it lies in 0.0.0.0/8";
    if ((a >> 24) == 127) return "it is a loopback address";
    if ((a >> 28) == 0xe) return "it is a multicast address";
    if ((a >> 28) == 0xf) return "it is a reserved or broadcast address";
    return nullptr;
}

// The other interface of the netstack that has the IPv4 address, or nullptr.
const Model::TknNic* Ipv4Owner(const Model::TknNic& nic, const Ipv4Address& address) {
    for (const auto& other : Lib::Read<Model::TknNicsSection>().nics) {
        if (other.name != nic.name && other.netstack == nic.netstack && !other.ipConfig.GetIpv4UseNone() &&
            other.ipConfig.GetIpv4Address() == address) {
            return &other;
        }
    }
    return nullptr;
}

void CheckStaticIpv4(const Model::TknNic& nic, const IpConfig& config) {
    Internal::CheckStaticIpv4(nic.name, nic.netstack, config, [&] {
        const auto* owner = Ipv4Owner(nic, config.GetIpv4Address());
        return owner ? owner->name : std::string();
    });
}

// ---------------------------------------------------------------- IPv6

// The interface identifier of a MAC address (modified EUI-64).
void Eui64(const HostCtl::Network::MacAddress& mac, std::uint8_t out[8]) {
    const auto& b = mac.GetBytes();
    std::uint8_t id[8] = {static_cast<std::uint8_t>(b[0] ^ 0x02), b[1], b[2], 0xff, 0xfe, b[3], b[4], b[5]};
    std::memcpy(out, id, 8);
}

Ipv6Address WithInterfaceId(const Ipv6Address& prefix, const std::uint8_t id[8]) {
    in6_addr address = prefix.GetAddress();
    std::memcpy(address.s6_addr + 8, id, 8);
    return Ipv6Address(address);
}

// The /64 prefixes routed directly on the interface (connected routes of its netstack), in
// route order; link-local prefixes are left out.
std::vector<Ipv6Address> OnLinkPrefixes(const Model::TknNic& nic) {
    std::vector<Ipv6Address> prefixes;
    const auto* stack = Lib::Read<Model::RoutesSection>().Find(nic.netstack);
    if (!stack) return prefixes;
    for (const auto& route : stack->ipv6) {
        if (route.interface != nic.name || !route.gateway.IsUnspecified() ||
            route.network.GetNetmask() != 64 || route.network.GetNetwork().IsLinkLocal()) {
            continue;
        }
        prefixes.push_back(route.network.GetNetwork());
    }
    return prefixes;
}

bool HasAddress(const IpConfig& config, const Ipv6Address& address) {
    const auto& networks = config.GetIpv6Network();
    return std::any_of(networks.begin(), networks.end(),
                       [&](const Ipv6Network& n) { return n.GetAddress() == address; });
}

void AddDerived(IpConfig& config, const Ipv6Address& address, int origin) {
    if (HasAddress(config, address)) return;
    config.AddIpv6Network(Ipv6Network(address, 64, origin, Ipv6Network::STATUS_PREFERRED));
}

// Removes the addresses keep() refuses.
template <class Keep>
void KeepAddresses(IpConfig& config, Keep keep) {
    std::vector<Ipv6Network> kept;
    for (const auto& n : config.GetIpv6Network()) {
        if (keep(n)) kept.push_back(n);
    }
    config.SetIpv6Networks(std::move(kept));
}

// Whether another interface of the netstack has the IPv6 address (duplicate address
// detection finds it).
bool Ipv6InUseElsewhere(const Model::TknNic& nic, const Ipv6Address& address) {
    if (address.IsLinkLocal()) return false;  // link-local addresses are per link
    for (const auto& other : Lib::Read<Model::TknNicsSection>().nics) {
        if (other.name != nic.name && other.netstack == nic.netstack && HasAddress(other.ipConfig, address))
            return true;
    }
    return false;
}

void ApplyIpv6(const Model::TknNic& nic, const IpConfig& before, IpConfig& config) {
    Internal::CheckIpv6(before, config);

    bool on = config.GetUseIpv6();
    bool wasOn = before.GetUseIpv6();
    bool ra = on && config.GetUseIpv6RouterAdvertised();
    bool wasRa = wasOn && before.GetUseIpv6RouterAdvertised();
    bool dhcp = on && config.GetUseIpv6Dhcp();
    bool wasDhcp = wasOn && before.GetUseIpv6Dhcp();
    auto isStatic = [](const Ipv6Network& n) { return n.GetIpv6AddressType() == Ipv6Network::ORIGIN_STATIC; };

    if (!on) {
        KeepAddresses(config, isStatic);  // the host's own addresses go with IPv6
    } else {
        std::uint8_t id[8];
        Eui64(nic.mac, id);
        if (!wasOn)
            AddDerived(config, WithInterfaceId(Ipv6Address("fe80::"), id), Ipv6Network::ORIGIN_AUTOCONF);
        if (ra && !wasRa) {
            for (const auto& prefix : OnLinkPrefixes(nic))
                AddDerived(config, WithInterfaceId(prefix, id), Ipv6Network::ORIGIN_AUTOCONF);
        }
        if (!ra && wasRa) {
            KeepAddresses(config, [](const Ipv6Network& n) {
                return n.GetIpv6AddressType() != Ipv6Network::ORIGIN_AUTOCONF || n.GetAddress().IsLinkLocal();
            });
        }
        if (dhcp && !wasDhcp) {
            auto prefixes = OnLinkPrefixes(nic);
            if (!prefixes.empty()) {
                const auto& b = nic.mac.GetBytes();
                std::uint8_t lease[8] = {0, 0, 0, 0, 0, 1, b[4], b[5]};
                AddDerived(config, WithInterfaceId(prefixes.front(), lease), Ipv6Network::ORIGIN_DHCP);
            }
        }
        if (!dhcp && wasDhcp) {
            KeepAddresses(config, [](const Ipv6Network& n) {
                return n.GetIpv6AddressType() != Ipv6Network::ORIGIN_DHCP;
            });
        }
    }

    // Addresses new to the interface go through duplicate address detection.
    std::vector<Ipv6Network> networks = config.GetIpv6Network();
    for (auto& n : networks) {
        if (!HasAddress(before, n.GetAddress()) && Ipv6InUseElsewhere(nic, n.GetAddress()))
            n.SetIpv6AddressStatus(Ipv6Network::STATUS_DUPLICATED);
    }
    config.SetIpv6Networks(std::move(networks));

    if (!config.GetUseIpv6Dhcp() && !config.GetUseIpv6RouterAdvertised()) config.SetIpv6DhcpDns(false);
}

}  // namespace

void CheckStaticIpv4(const std::string& name, const std::string& netstack, const IpConfig& config,
                     const std::function<std::string()>& owner) {
    const Ipv4Address& address = config.GetIpv4Address();
    const Ipv4Address& netmask = config.GetIpv4Netmask();
    const Ipv4Address& gateway = config.GetIpv4Gateway();
    if (address.IsUnspecified()) {
        if (!netmask.IsUnspecified()) {
            throw HostCtlException("IPv4 netmask " + netmask.GetStringAddress() +
                                   " given without an IPv4 address");
        }
        if (!gateway.IsUnspecified()) {
            throw HostCtlException("IPv4 gateway " + gateway.GetStringAddress() +
                                   " given without an IPv4 address");
        }
        return;
    }
    if (const char* why = NotAHostAddress(address)) {
        throw HostCtlException("IPv4 address " + address.GetStringAddress() +
                               " cannot be assigned to an interface: " + why);
    }
    if (netmask.IsUnspecified() || !netmask.IsNetmask()) {
        throw HostCtlException("Invalid IPv4 netmask " + netmask.GetStringAddress() +
                               ": it must be a contiguous mask of 1 to 32 bits");
    }
    unsigned prefix = PrefixLength(netmask);
    Ipv4Network subnet(Ipv4Network(address, prefix).GetNetwork(), prefix);
    std::string subnetText = subnet.GetStringAddress();
    if (prefix <= 30) {
        if (address == subnet.GetAddress()) {
            throw HostCtlException("IPv4 address " + address.GetStringAddress() +
                                   " is the network address of " + subnetText);
        }
        if (address == config.GetIpv4Broadcast()) {
            throw HostCtlException("IPv4 address " + address.GetStringAddress() +
                                   " is the broadcast address of " + subnetText);
        }
    }
    if (!gateway.IsUnspecified()) {
        if (!subnet.Contains(gateway)) {
            throw HostCtlException("IPv4 gateway " + gateway.GetStringAddress() + " is not on the subnet " +
                                   subnetText + " of " + name);
        }
        if (gateway == address) {
            throw HostCtlException("IPv4 gateway " + gateway.GetStringAddress() +
                                   " is the interface's own address");
        }
    }
    if (std::string other = owner(); !other.empty()) {
        throw HostCtlException("IPv4 address " + address.GetStringAddress() + " is already in use by " +
                               other + " on netstack " + Lib::Quote(netstack));
    }
}

namespace {

bool IsMulticast(const Ipv6Address& address) {
    return address.GetAddress().s6_addr[0] == 0xff;
}

bool IsLoopback(const Ipv6Address& address) {
    static const Ipv6Address loopback("::1");
    return address == loopback;
}

void CheckIpv6Unicast(const Ipv6Address& address, const std::string& what) {
    if (address.IsUnspecified() || IsMulticast(address) || IsLoopback(address)) {
        throw HostCtlException(what + " " + address.GetStringAddress() + " is not a unicast address");
    }
}

}  // namespace

void CheckIpv6(const IpConfig& before, const IpConfig& config) {
    if (!config.GetIpv6Gateway().IsUnspecified()) CheckIpv6Unicast(config.GetIpv6Gateway(), "IPv6 gateway");
    for (const auto& n : config.GetIpv6Network()) {
        if (HasAddress(before, n.GetAddress())) continue;  // checked when it was added
        CheckIpv6Unicast(n.GetAddress(), "IPv6 address");
        if (n.GetNetmask() < 1 || n.GetNetmask() > 128) {
            throw HostCtlException("IPv6 address " + n.GetStringAddress() +
                                   " has an invalid prefix length: it must be between 1 and 128");
        }
    }
}

IpConfig CheckedIpConfig(const Model::TknNic& nic, const IpConfig* previous, IpConfig config) {
    const IpConfig none;
    const IpConfig& before = previous ? *previous : none;

    if (config.GetUseDhcp()) {
        // The address, netmask and gateway belong to the lease: kept while DHCP stays on,
        // none until a lease arrives.
        bool dhcpDns = config.GetDhcpDns();
        bool keepLease = previous && before.GetUseDhcp();
        config.SetIpv4Address(keepLease ? before.GetIpv4Address() : Ipv4Address());
        config.SetIpv4Netmask(keepLease ? before.GetIpv4Netmask() : Ipv4Address());
        config.SetIpv4Gateway(keepLease ? before.GetIpv4Gateway() : Ipv4Address());
        config.SetUseDhcp(true);
        config.SetDhcpDns(dhcpDns);
    } else if (config.GetIpv4UseNone()) {
        config.SetIpv4UseNone();
    } else {
        CheckStaticIpv4(nic, config);
        config.SetDhcpDns(false);
    }

    ApplyIpv6(nic, before, config);
    return config;
}

void SyncTknNic(const std::string& name) {
    const Model::TknNic& nic = FindTknNic(name);
    const IpConfig& config = nic.ipConfig;

    if (nic.portId) {
        const auto* port = Lib::Read<Model::PortsSection>().Find(*nic.portId);
        if (port && port->ipv4 != config.GetIpv4Address())
            Lib::Write<Model::PortsSection>().Find(*nic.portId)->ipv4 = config.GetIpv4Address();
    }

    // Connected routes: one per subnet of the interface's addresses, gateway unset.
    std::vector<Model::Ipv4Route> ipv4;
    if (!config.GetIpv4Address().IsUnspecified() && !config.GetIpv4Netmask().IsUnspecified()) {
        unsigned prefix = PrefixLength(config.GetIpv4Netmask());
        ipv4.push_back({Ipv4Network(Ipv4Network(config.GetIpv4Address(), prefix).GetNetwork(), prefix),
                        Ipv4Address(), name, config.GetUseDhcp() ? "DHCP" : "MANUAL"});
    }
    std::vector<Model::Ipv6Route> ipv6;
    if (config.GetUseIpv6()) {
        for (const auto& n : config.GetIpv6Network()) {
            if (n.GetNetmask() >= 128) continue;
            Ipv6Network subnet(n.GetNetwork(), n.GetNetmask());
            bool known = std::any_of(ipv6.begin(), ipv6.end(),
                                     [&](const Model::Ipv6Route& r) { return r.network == subnet; });
            if (!known) ipv6.push_back({subnet, Ipv6Address(), name});
        }
    }

    const auto* current = Lib::Read<Model::RoutesSection>().Find(nic.netstack);
    auto connected = [&](const auto& route) {
        return route.interface == name && route.gateway.IsUnspecified();
    };
    auto same4 = [](const Model::Ipv4Route& a, const Model::Ipv4Route& b) {
        return a.network == b.network && a.source == b.source;
    };
    auto same6 = [](const Model::Ipv6Route& a, const Model::Ipv6Route& b) { return a.network == b.network; };
    auto upToDate = [&](const auto& routes, const auto& wanted, auto same) {
        std::size_t count = 0;
        for (const auto& route : routes) {
            if (!connected(route)) continue;
            ++count;
            if (std::none_of(wanted.begin(), wanted.end(), [&](const auto& w) { return same(route, w); }))
                return false;
        }
        return count == wanted.size();
    };
    if (current ? upToDate(current->ipv4, ipv4, same4) && upToDate(current->ipv6, ipv6, same6)
                : ipv4.empty() && ipv6.empty()) {
        SyncGatewayRoutes(nic.netstack);
        return;
    }

    auto& routes = Lib::Write<Model::RoutesSection>();
    auto* stack = routes.Find(nic.netstack);
    if (!stack) {
        routes.stacks.push_back({});
        stack = &routes.stacks.back();
        stack->netstack = nic.netstack;
    }
    // Routes that stay keep their place; new ones go to the end.
    auto update = [&](auto& list, const auto& wanted, auto same) {
        std::erase_if(list, [&](const auto& route) {
            return connected(route) &&
                   std::none_of(wanted.begin(), wanted.end(), [&](const auto& w) { return same(route, w); });
        });
        for (const auto& w : wanted) {
            if (std::none_of(list.begin(), list.end(),
                             [&](const auto& route) { return connected(route) && same(route, w); })) {
                list.push_back(w);
            }
        }
    };
    update(stack->ipv4, ipv4, same4);
    update(stack->ipv6, ipv6, same6);
    SyncGatewayRoutes(nic.netstack);
}

void RemoveTknNic(const std::string& name) {
    const Model::TknNic nic = FindTknNic(name);

    // The port and the connection point.
    if (nic.portId)
        std::erase_if(Lib::Write<Model::PortsSection>().ports,
                      [&](const Model::Port& p) { return p.id == *nic.portId; });
    std::string portset = PortsetOf(nic.connection);
    if (nic.connection.type == Model::ConnectionPoint::kPortGroup) {
        if (auto* vswitch = Lib::Write<Model::VSwitchesSection>().Find(portset)) {
            if (vswitch->usedPorts > 0) --vswitch->usedPorts;
            for (auto& group : vswitch->portGroups) {
                if (group.name == nic.connection.portGroup && group.activeClients > 0) --group.activeClients;
            }
        }
    } else if (nic.connection.type == Model::ConnectionPoint::kDvPort) {
        if (auto* dvs = Lib::Write<Model::DvSwitchesSection>().Find(portset)) {
            if (auto* port = dvs->FindPort(nic.connection.dvPort.GetPortId())) {
                std::erase(port->clients, name);
                if (port->clients.empty()) {
                    port->inUse = false;
                    port->connectionId = 0;
                    if (dvs->usedPorts > 0) --dvs->usedPorts;
                }
            }
        }
    }

    // What refers to the interface.
    auto onNic = [&](const auto& entry) { return entry.interface == name; };
    for (auto& stack : Lib::Write<Model::RoutesSection>().stacks) {
        std::erase_if(stack.ipv4, onNic);
        std::erase_if(stack.ipv6, onNic);
    }
    for (auto& stack : Lib::Write<Model::NeighborsSection>().stacks) {
        std::erase_if(stack.ipv4, onNic);
        std::erase_if(stack.ipv6, onNic);
    }
    std::erase_if(Lib::Write<Model::MulticastSection>().memberships, onNic);

    std::erase_if(Lib::Write<Model::TknNicsSection>().nics,
                  [&](const Model::TknNic& n) { return n.name == name; });
    // A default gateway another interface reaches gets its route back through it.
    SyncGatewayRoutes(nic.netstack);
}

}  // namespace TknCtl::Network::Internal

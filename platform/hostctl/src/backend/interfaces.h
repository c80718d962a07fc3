// IP interfaces of a real host: their addresses, gateways, IPv6 settings and tags, and the
// interfaces created at connection points.
//
// The operations (TknCtl::Network::TarkonNicInfoImpl and the interface objects it hands out,
// src/network/tknnic*.cpp) keep the rules every host shares: a static IPv4 address is a
// unicast host address with a contiguous netmask, unique on its netstack, its gateway on its
// subnet; IPv6 addresses and gateways are unicast; an MTU lies within TknNic::MIN_MTU and
// MAX_MTU; a tag is one of the known types and is removed only where it is set; a new
// interface is named "tkn0" to "tkn255" by a name no interface has, its MAC address is unicast
// and unused, and a connection point carries one interface. This area reads the host and
// carries out or refuses what passed them.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "hostctl/network/tknnic.h"

namespace TknCtl::Backend {

// An IP interface: its name is unique within its netstack only.
struct InterfaceId {
    std::string netstack;
    std::string name;
    bool operator==(const InterfaceId&) const = default;
};

// What an interface is besides its IP configuration.
struct InterfaceLink {
    HostCtl::Network::MacAddress mac;  // unset for a device without a link-layer address
    int mtu = 0;
    int tsoMss = 0;    // the largest packet the host hands the device to segment
    int rxQueues = 0;  // receive queues
    bool enabled = false;
};

class Interfaces {
public:
    virtual ~Interfaces();

    // The interfaces of a netstack, or of every netstack (empty name) in the host's order of
    // netstacks; throws HostCtlException for a netstack the host does not have.
    virtual std::vector<InterfaceId> List(const std::string& netstack) = 0;
    // The interface of that name; the first in the order of List when several netstacks have
    // one. Nothing when there is none.
    virtual std::optional<InterfaceId> Find(const std::string& name) = 0;

    // Each of the following throws HostCtlException when the interface is gone.
    virtual InterfaceLink GetLink(const InterfaceId& id) = 0;
    virtual void SetEnabled(const InterfaceId& id, bool enabled) = 0;
    virtual void SetMtu(const InterfaceId& id, int mtu) = 0;

    // The IP configuration as the host holds it: the IPv4 address (the first of the interface,
    // with its netmask and origin), the gateways (the default routes through the interface),
    // the IPv6 settings and every IPv6 address with its origin and state.
    virtual HostCtl::Network::IpConfig GetIpConfig(const InterfaceId& id) = 0;
    // Carries out a configuration that passed the shared rules, or refuses what the host cannot
    // do, changing nothing then.
    virtual void SetIpConfig(const InterfaceId& id, const HostCtl::Network::IpConfig& config) = 0;
    // The IP interface of the netstack that holds the address; empty when none does.
    virtual std::string InterfaceWithAddress(const std::string& netstack,
                                             const HostCtl::Network::IpAddress& address) = 0;

    // Where the interface attaches, and its virtual port; nothing when it has none.
    virtual std::unique_ptr<HostCtl::Network::ConnectionPoint> GetConnectionPoint(const InterfaceId& id) = 0;
    virtual std::unique_ptr<HostCtl::Network::Port> GetPort(const InterfaceId& id) = 0;

    // The interface's tags in the order they were set, and replacing them (the types are valid).
    virtual std::vector<HostCtl::Network::TknNicTagType> GetTags(const InterfaceId& id) = 0;
    virtual void SetTags(const InterfaceId& id, const std::vector<HostCtl::Network::TknNicTagType>& tags) = 0;

    virtual std::vector<HostCtl::Network::TknNic::MulticastGroup> GetMulticastGroups(
        const InterfaceId& id) = 0;

    // ---- creating and removing interfaces (TarkonNicInfoImpl::AddTarkonNic, RemoveTarkonNic,
    // TknNic::Remove): the operation checks names, sizes and addresses and composes the rules
    // between them; the host says what it holds and carries the change out.

    // The interface attached at a connection point, or nothing. Throws HostCtlException for a
    // kind of connection point the host does not have, saying why.
    virtual std::optional<InterfaceId> AttachedAt(const HostCtl::Network::ConnectionPoint& point) = 0;
    // Throws HostCtlException when a new interface cannot attach at the connection point (it
    // does not exist, its switch has no free port, the host has no such connection points);
    // changes nothing.
    virtual void CheckAttachable(const HostCtl::Network::ConnectionPoint& point) = 0;
    // Whether a device of the host (of any netstack it can read) has that link-layer address.
    virtual bool MacInUse(const HostCtl::Network::MacAddress& mac) = 0;
    // Creates an interface at a connection point, on a netstack the host has, enabled and
    // without IP configuration (the operation gives it one): name empty: the lowest free
    // "tknN"; mac unset: one of the host's choosing; tsoMss, mtu and rxQueues as checked by the
    // operation. Throws HostCtlException when the host cannot; nothing is left behind then.
    virtual InterfaceId Add(const HostCtl::Network::ConnectionPoint& point, const std::string& netstack,
                            const HostCtl::Network::MacAddress& mac, unsigned tsoMss, unsigned mtu,
                            unsigned rxQueues, const std::string& name) = 0;
    // Removes an interface the host created at a connection point, with what refers to it (its
    // port, routes, neighbours, tags); refuses others, saying why.
    virtual void Remove(const InterfaceId& id) = 0;
};

}  // namespace TknCtl::Backend

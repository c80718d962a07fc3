// What the kernel holds of a netstack's IP configuration (devices, addresses, routes, neighbours,
// multicast memberships), as the interfaces and routing areas read it. Each table is read when
// a command first asks for it and kept while the command asks again (a listing asks once per
// interface); any change the process makes (Kernel::Generation) has every table read again at
// its next use. Nothing is kept beyond the process.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "hostctl/network/types.h"
#include "kernel/addresses.h"
#include "kernel/links.h"
#include "kernel/multicast.h"
#include "kernel/neighbours.h"
#include "kernel/netlink.h"
#include "kernel/routes.h"

namespace TknCtl::Linux {

class Context;

// Whether a device carries IP as an interface of the host: every device but the loopback and
// the ports of a bridge (or of a bond, team or Open vSwitch bridge, which carry no IP of their
// own either). links are the namespace's, to find the device's master.
bool IsIpInterface(const Kernel::Link& link, const std::vector<Kernel::Link>& links);

// How an IPv6 address came to the interface: Ipv6Network::ORIGIN_STATIC (given by an
// administrator), ORIGIN_AUTOCONF (made by the kernel: link-local, or from router
// advertisements) or ORIGIN_DHCP (leased: it expires and no router advertisement made it).
int Ipv6Origin(const Kernel::Address& address);
// Its state: Ipv6Network::STATUS_TENTATIVE, STATUS_DUPLICATED, STATUS_DEPRECATED or STATUS_PREFERRED.
int Ipv6Status(const Kernel::Address& address);
// Whether an IPv4 address is leased (it expires: a DHCP client gave it).
bool IsLeased(const Kernel::Address& address);

// Where a route came from, by the protocol that installed it: "MANUAL", "DHCP", "RA", "BGP", ...
std::string RouteSource(unsigned protocol);
// A neighbour entry: the IPv6 state number (0 "Incomplete" ... 8 "None", routing.cpp), its type
// ("Static", "Router", "Dynamic") and the seconds left in its state.
std::uint32_t NeighbourState(std::uint16_t nud);
std::string NeighbourType(const Kernel::Neighbour& entry);
std::uint32_t NeighbourExpiry(const Kernel::Neighbour& entry, const Kernel::NeighbourTiming& timing);

// What an interface's configuration after a change (now) lacks of what was asked (wanted, the
// configuration before being before); empty when it holds it all. The default route of IPv6 is
// not compared here (the routes router advertisements bring are told apart by the view).
std::string ConfigDifference(const HostCtl::Network::IpConfig& before,
                             const HostCtl::Network::IpConfig& wanted, const HostCtl::Network::IpConfig& now);

class NetstackView {
public:
    NetstackView(std::string netstack, Kernel::Namespace ns);

    const std::string& Netstack() const { return netstack_; }
    const Kernel::Namespace& Namespace() const { return ns_; }

    const std::vector<Kernel::Link>& Links();
    const Kernel::Link* LinkByIndex(int index);
    const Kernel::Link* LinkByName(const std::string& name);
    // The IP interfaces (IsIpInterface) in index order.
    std::vector<const Kernel::Link*> IpInterfaces();
    // The IP interface of that name, or nullptr.
    const Kernel::Link* IpInterface(const std::string& name);
    // The name of the device of that index; empty when there is none.
    std::string NameOf(int index);

    // Both families, in the kernel's order; those of one device.
    const std::vector<Kernel::Address>& Addresses();
    std::vector<const Kernel::Address*> AddressesOf(int index);
    // The routes of the main table of a family, and its default routes alone.
    const std::vector<Kernel::Route>& MainRoutes(int family);
    const std::vector<Kernel::Route>& DefaultRoutes(int family);
    const std::vector<Kernel::Neighbour>& Neighbours(int family);
    // The timings of a device's neighbour table of a family (the table's defaults when the
    // device has none of its own).
    Kernel::NeighbourTiming TimingOf(int family, int index);
    const std::vector<Kernel::Membership>& Memberships();

private:
    void Fresh();
    // The names and kinds of the links, looked up by name in constant time.
    void IndexLinks();

    struct LinkEntry {
        std::size_t position = 0;
        bool ipInterface = false;
    };

    std::string netstack_;
    Kernel::Namespace ns_;
    unsigned long generation_ = 0;
    std::optional<std::vector<Kernel::Link>> links_;
    std::optional<std::unordered_map<std::string, LinkEntry>> byName_;
    std::optional<std::vector<Kernel::Address>> addresses_;
    std::optional<std::unordered_map<int, std::vector<std::size_t>>> addressesByIndex_;
    std::optional<std::vector<Kernel::Route>> routes4_, routes6_, defaults4_, defaults6_;
    std::optional<std::vector<Kernel::Neighbour>> neighbours4_, neighbours6_;
    std::optional<std::vector<Kernel::NeighbourTiming>> timings_;
    std::optional<std::vector<Kernel::Membership>> memberships_;
};

// The views of a session's netstacks.
class KernelViews {
public:
    explicit KernelViews(Context& context) : context_(context) {}
    // The view of a netstack; throws HostCtlException("Netstack instance 'NAME' does not
    // exist") for a netstack the host does not have.
    NetstackView& Of(const std::string& netstack);

private:
    Context& context_;
    std::map<std::string, std::unique_ptr<NetstackView>> views_;
};

}  // namespace TknCtl::Linux

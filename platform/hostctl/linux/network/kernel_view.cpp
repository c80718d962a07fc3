#include "network/kernel_view.h"

#include <linux/if.h>
#include <linux/if_addr.h>
#include <linux/rtnetlink.h>
#include <sys/socket.h>

#include <algorithm>

#include "core/context.h"
#include "hostctl/network/types.h"
#include "kernel/request.h"

namespace TknCtl::Linux {

using HostCtl::Network::Ipv6Network;

bool IsIpInterface(const Kernel::Link& link, const std::vector<Kernel::Link>& links) {
    if (link.loopback) return false;
    if (link.master == 0) return true;
    auto master = std::find_if(links.begin(), links.end(),
                               [&](const Kernel::Link& l) { return l.index == link.master; });
    if (master == links.end()) return true;
    const std::string& kind = master->kind;
    // A VRF is a master whose members keep their addresses.
    return !(kind == "bridge" || kind == "bond" || kind == "team" || kind == "openvswitch");
}

int Ipv6Origin(const Kernel::Address& address) {
    switch (address.protocol) {
        case IFAPROT_KERNEL_LL:
        case IFAPROT_KERNEL_RA:
        case IFAPROT_KERNEL_LO:
            return Ipv6Network::ORIGIN_AUTOCONF;
        default:
            break;
    }
    if (address.flags & IFA_F_TEMPORARY) return Ipv6Network::ORIGIN_AUTOCONF;  // a privacy address
    if (address.flags & IFA_F_PERMANENT) {
        // A kernel that does not say who made an address: the link-local one it makes itself is
        // as permanent as an administrator's.
        if (address.protocol == IFAPROT_UNSPEC && address.scope == RT_SCOPE_LINK &&
            address.address.rfind("fe80:", 0) == 0 && address.prefixLength == 64)
            return Ipv6Network::ORIGIN_AUTOCONF;
        return Ipv6Network::ORIGIN_STATIC;
    }
    // An address that expires came from a router advertisement (a /64 the kernel made) or
    // from a DHCPv6 lease (a /128 a client added).
    return address.prefixLength == 128 ? Ipv6Network::ORIGIN_DHCP : Ipv6Network::ORIGIN_AUTOCONF;
}

int Ipv6Status(const Kernel::Address& address) {
    if (address.flags & IFA_F_DADFAILED) return Ipv6Network::STATUS_DUPLICATED;
    if (address.flags & IFA_F_TENTATIVE) return Ipv6Network::STATUS_TENTATIVE;
    if (address.flags & IFA_F_DEPRECATED) return Ipv6Network::STATUS_DEPRECATED;
    return Ipv6Network::STATUS_PREFERRED;
}

bool IsLeased(const Kernel::Address& address) {
    return !(address.flags & IFA_F_PERMANENT) && address.validLifetime != Kernel::kForever;
}

NetstackView::NetstackView(std::string netstack, Kernel::Namespace ns)
    : netstack_(std::move(netstack)), ns_(std::move(ns)), generation_(Kernel::Generation()) {}

void NetstackView::Fresh() {
    if (generation_ == Kernel::Generation()) return;
    generation_ = Kernel::Generation();
    links_.reset();
    addresses_.reset();
    routes4_.reset();
    routes6_.reset();
    neighbours4_.reset();
    neighbours6_.reset();
    timings_.reset();
    memberships_.reset();
}

const std::vector<Kernel::Link>& NetstackView::Links() {
    Fresh();
    if (!links_) links_ = Kernel::ListLinks(ns_);
    return *links_;
}

const Kernel::Link* NetstackView::LinkByIndex(int index) {
    const auto& links = Links();
    // In index order (ListLinks sorts them).
    auto it = std::lower_bound(links.begin(), links.end(), index,
                               [](const Kernel::Link& link, int wanted) { return link.index < wanted; });
    return it != links.end() && it->index == index ? &*it : nullptr;
}

const Kernel::Link* NetstackView::LinkByName(const std::string& name) {
    for (const auto& link : Links()) {
        if (link.name == name) return &link;
    }
    return nullptr;
}

std::vector<const Kernel::Link*> NetstackView::IpInterfaces() {
    const auto& links = Links();
    std::vector<const Kernel::Link*> out;
    out.reserve(links.size());
    for (const auto& link : links) {
        if (IsIpInterface(link, links)) out.push_back(&link);
    }
    return out;
}

const Kernel::Link* NetstackView::IpInterface(const std::string& name) {
    const auto* link = LinkByName(name);
    return link && IsIpInterface(*link, Links()) ? link : nullptr;
}

std::string NetstackView::NameOf(int index) {
    const auto* link = LinkByIndex(index);
    return link ? link->name : std::string();
}

const std::vector<Kernel::Address>& NetstackView::Addresses() {
    Fresh();
    if (!addresses_) addresses_ = Kernel::ListAddresses(ns_, AF_UNSPEC);
    return *addresses_;
}

const std::vector<Kernel::Route>& NetstackView::MainRoutes(int family) {
    Fresh();
    auto& routes = family == AF_INET ? routes4_ : routes6_;
    if (!routes) {
        routes = Kernel::ListRoutes(ns_, family);
        std::erase_if(*routes, [](const Kernel::Route& r) { return r.table != Kernel::kMainTable; });
    }
    return *routes;
}

const std::vector<Kernel::Neighbour>& NetstackView::Neighbours(int family) {
    Fresh();
    auto& neighbours = family == AF_INET ? neighbours4_ : neighbours6_;
    if (!neighbours) neighbours = Kernel::ListNeighbours(ns_, family);
    return *neighbours;
}

Kernel::NeighbourTiming NetstackView::TimingOf(int family, int index) {
    Fresh();
    if (!timings_) timings_ = Kernel::ListNeighbourTimings(ns_);
    Kernel::NeighbourTiming table;
    for (const auto& timing : *timings_) {
        if (timing.family != family) continue;
        if (timing.index == index) return timing;
        if (timing.index == 0) table = timing;
    }
    return table;
}

const std::vector<Kernel::Membership>& NetstackView::Memberships() {
    Fresh();
    if (!memberships_) memberships_ = Kernel::ListMemberships(ns_);
    return *memberships_;
}

NetstackView& KernelViews::Of(const std::string& netstack) {
    Kernel::Namespace ns = context_.NamespaceOf(netstack);
    std::string key = netstack.empty() ? std::string(Context::kDefaultNetstack) : netstack;
    auto& view = views_[key];
    if (!view) view = std::make_unique<NetstackView>(key, ns);
    return *view;
}

}  // namespace TknCtl::Linux

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
    byName_.reset();
    addresses_.reset();
    addressesByIndex_.reset();
    routes4_.reset();
    routes6_.reset();
    defaults4_.reset();
    defaults6_.reset();
    neighbours4_.reset();
    neighbours6_.reset();
    timings_.reset();
    memberships_.reset();
}

const std::vector<Kernel::Link>& NetstackView::Links() {
    Fresh();
    if (!links_) links_ = Kernel::ListLinks(ns_, false);
    return *links_;
}

const Kernel::Link* NetstackView::LinkByIndex(int index) {
    const auto& links = Links();
    // In index order (ListLinks sorts them).
    auto it = std::lower_bound(links.begin(), links.end(), index,
                               [](const Kernel::Link& link, int wanted) { return link.index < wanted; });
    return it != links.end() && it->index == index ? &*it : nullptr;
}

void NetstackView::IndexLinks() {
    const auto& links = Links();
    if (byName_) return;
    byName_.emplace();
    byName_->reserve(links.size());
    for (std::size_t i = 0; i < links.size(); ++i)
        (*byName_)[links[i].name] = {i, IsIpInterface(links[i], links)};
}

const Kernel::Link* NetstackView::LinkByName(const std::string& name) {
    IndexLinks();
    auto it = byName_->find(name);
    return it == byName_->end() ? nullptr : &(*links_)[it->second.position];
}

std::vector<const Kernel::Link*> NetstackView::IpInterfaces() {
    IndexLinks();
    const auto& links = *links_;
    std::vector<const Kernel::Link*> out;
    out.reserve(links.size());
    for (const auto& link : links) {
        if (byName_->at(link.name).ipInterface) out.push_back(&link);
    }
    return out;
}

const Kernel::Link* NetstackView::IpInterface(const std::string& name) {
    IndexLinks();
    auto it = byName_->find(name);
    return it == byName_->end() || !it->second.ipInterface ? nullptr : &(*links_)[it->second.position];
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

std::vector<const Kernel::Address*> NetstackView::AddressesOf(int index) {
    const auto& addresses = Addresses();
    if (!addressesByIndex_) {
        addressesByIndex_.emplace();
        for (std::size_t i = 0; i < addresses.size(); ++i)
            (*addressesByIndex_)[addresses[i].index].push_back(i);
    }
    std::vector<const Kernel::Address*> out;
    if (auto it = addressesByIndex_->find(index); it != addressesByIndex_->end()) {
        out.reserve(it->second.size());
        for (std::size_t i : it->second)
            out.push_back(&addresses[i]);
    }
    return out;
}

const std::vector<Kernel::Route>& NetstackView::MainRoutes(int family) {
    Fresh();
    auto& routes = family == AF_INET ? routes4_ : routes6_;
    if (!routes) routes = Kernel::ListRoutes(ns_, family, Kernel::kMainTable);
    return *routes;
}

const std::vector<Kernel::Route>& NetstackView::DefaultRoutes(int family) {
    Fresh();
    auto& defaults = family == AF_INET ? defaults4_ : defaults6_;
    if (!defaults) {
        const auto& all = family == AF_INET ? routes4_ : routes6_;
        if (all) {
            defaults.emplace();
            for (const auto& route : *all) {
                if (route.IsDefault()) defaults->push_back(route);
            }
        } else {
            defaults = Kernel::ListRoutes(ns_, family, Kernel::kMainTable, true);
        }
    }
    return *defaults;
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

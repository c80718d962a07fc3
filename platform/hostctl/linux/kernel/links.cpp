#include "kernel/links.h"

#include <linux/if.h>
#include <linux/ipv6.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/cache.h>
#include <netlink/msg.h>
#include <netlink/netlink.h>
#include <netlink/route/link.h>

#include <algorithm>
#include <cstring>
#include <memory>

#include "hostctl/exception.h"
#include "kernel/request.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

struct LinkPut {
    void operator()(rtnl_link* link) const { rtnl_link_put(link); }
};
struct AddrPut {
    void operator()(nl_addr* addr) const { nl_addr_put(addr); }
};
using LinkObject = std::unique_ptr<rtnl_link, LinkPut>;

std::string AddressText(nl_addr* addr) {
    if (!addr || nl_addr_get_len(addr) == 0) return {};
    char buffer[128];
    nl_addr2str(addr, buffer, sizeof(buffer));
    std::string text = buffer;
    return text == "none" ? std::string() : text;
}

// The IPv6 settings of IFLA_AF_SPEC / AF_INET6 / IFLA_INET6_CONF: one 32-bit value per
// setting, indexed by DEVCONF_....
std::optional<Link::Ipv6Settings> ParseIpv6Settings(nlmsghdr* header) {
    if (!nlmsg_valid_hdr(header, sizeof(ifinfomsg))) return std::nullopt;
    nlattr* tb[IFLA_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(ifinfomsg), tb, IFLA_MAX, nullptr) < 0 || !tb[IFLA_AF_SPEC])
        return std::nullopt;
    nlattr* family = nullptr;
    int remaining = 0;
    nla_for_each_nested(family, tb[IFLA_AF_SPEC], remaining) {
        if (nla_type(family) != AF_INET6) continue;
        nlattr* inet6[IFLA_INET6_MAX + 1] = {};
        if (nla_parse_nested(inet6, IFLA_INET6_MAX, family, nullptr) < 0 || !inet6[IFLA_INET6_CONF]) break;
        const auto* values = static_cast<const std::int32_t*>(nla_data(inet6[IFLA_INET6_CONF]));
        int count = nla_len(inet6[IFLA_INET6_CONF]) / static_cast<int>(sizeof(std::int32_t));
        auto value = [&](int index) { return index < count ? values[index] : 0; };
        Link::Ipv6Settings settings;
        settings.forwarding = value(DEVCONF_FORWARDING) != 0;
        settings.acceptRa = value(DEVCONF_ACCEPT_RA);
        settings.disabled = value(DEVCONF_DISABLE_IPV6) != 0;
        return settings;
    }
    return std::nullopt;
}

}  // namespace

Link LinkFromObject(rtnl_link* object) {
    Link link;
    link.index = rtnl_link_get_ifindex(object);
    if (const char* name = rtnl_link_get_name(object)) link.name = name;
    if (const char* kind = rtnl_link_get_type(object)) link.kind = kind;
    link.mac = AddressText(rtnl_link_get_addr(object));
    link.broadcast = AddressText(rtnl_link_get_broadcast(object));
    link.mtu = rtnl_link_get_mtu(object);
    link.flags = rtnl_link_get_flags(object);
    link.up = link.flags & IFF_UP;
    link.lowerUp = link.flags & IFF_LOWER_UP;
    link.loopback = link.flags & IFF_LOOPBACK;
    char state[32];
    rtnl_link_operstate2str(rtnl_link_get_operstate(object), state, sizeof(state));
    link.operState = state;
    link.master = rtnl_link_get_master(object);
    link.peer = rtnl_link_get_link(object);
    link.txQueueLength = rtnl_link_get_txqlen(object);
    link.numTxQueues = rtnl_link_get_num_tx_queues(object);
    link.numRxQueues = rtnl_link_get_num_rx_queues(object);
    std::uint32_t gsoMaxSize = 0;
    if (rtnl_link_get_gso_max_size(object, &gsoMaxSize) == 0) link.gsoMaxSize = gsoMaxSize;
    auto stat = [&](rtnl_link_stat_id_t id) { return rtnl_link_get_stat(object, id); };
    auto& s = link.stats;
    s.rxPackets = stat(RTNL_LINK_RX_PACKETS);
    s.txPackets = stat(RTNL_LINK_TX_PACKETS);
    s.rxBytes = stat(RTNL_LINK_RX_BYTES);
    s.txBytes = stat(RTNL_LINK_TX_BYTES);
    s.rxErrors = stat(RTNL_LINK_RX_ERRORS);
    s.txErrors = stat(RTNL_LINK_TX_ERRORS);
    s.rxDropped = stat(RTNL_LINK_RX_DROPPED);
    s.txDropped = stat(RTNL_LINK_TX_DROPPED);
    s.multicast = stat(RTNL_LINK_MULTICAST);
    s.collisions = stat(RTNL_LINK_COLLISIONS);
    s.rxLengthErrors = stat(RTNL_LINK_RX_LEN_ERR);
    s.rxOverErrors = stat(RTNL_LINK_RX_OVER_ERR);
    s.rxCrcErrors = stat(RTNL_LINK_RX_CRC_ERR);
    s.rxFrameErrors = stat(RTNL_LINK_RX_FRAME_ERR);
    s.rxFifoErrors = stat(RTNL_LINK_RX_FIFO_ERR);
    s.rxMissedErrors = stat(RTNL_LINK_RX_MISSED_ERR);
    s.txAbortedErrors = stat(RTNL_LINK_TX_ABORT_ERR);
    s.txCarrierErrors = stat(RTNL_LINK_TX_CARRIER_ERR);
    s.txFifoErrors = stat(RTNL_LINK_TX_FIFO_ERR);
    s.txHeartbeatErrors = stat(RTNL_LINK_TX_HBEAT_ERR);
    s.txWindowErrors = stat(RTNL_LINK_TX_WIN_ERR);
    return link;
}

std::optional<Link> ParseLink(nl_msg* message) {
    std::optional<Link> out;
    auto take = [](nl_object* object, void* arg) {
        if (std::strcmp(nl_object_get_type(object), "route/link") == 0)
            *static_cast<std::optional<Link>*>(arg) = LinkFromObject(reinterpret_cast<rtnl_link*>(object));
    };
    nl_msg_parse(message, take, &out);
    if (out) out->ipv6 = ParseIpv6Settings(nlmsg_hdr(message));
    return out;
}

std::vector<Link> ListLinks(const Namespace& ns) {
    std::vector<Link> links;
    ifinfomsg header{};
    header.ifi_family = AF_UNSPEC;
    Dump(
        ns, RTM_GETLINK, &header, sizeof(header), [&] { links.clear(); },
        [&](nl_msg* message) {
            if (auto link = ParseLink(message)) links.push_back(std::move(*link));
        },
        "cannot list the network devices");
    std::sort(links.begin(), links.end(), [](const Link& a, const Link& b) { return a.index < b.index; });
    return links;
}

std::optional<Link> FindLink(const Namespace& ns, const std::string& name) {
    rtnl_link* object = nullptr;
    int error = rtnl_link_get_kernel(RouteSocket(ns), 0, name.c_str(), &object);
    if (error == -NLE_OBJ_NOTFOUND || error == -NLE_NODEV) return std::nullopt;
    Check(error, "cannot read network device " + name);
    LinkObject owned(object);
    return LinkFromObject(object);
}

nl_msg* BuildLinkChange(int index, const LinkChange& change) {
    LinkObject original(rtnl_link_alloc());
    LinkObject wanted(rtnl_link_alloc());
    if (!original || !wanted) throw HostCtlException("out of memory");
    rtnl_link_set_ifindex(original.get(), index);
    if (change.up) {
        if (*change.up) {
            rtnl_link_set_flags(wanted.get(), IFF_UP);
        } else {
            rtnl_link_unset_flags(wanted.get(), IFF_UP);
        }
    }
    if (change.mtu) rtnl_link_set_mtu(wanted.get(), *change.mtu);
    if (change.mac) {
        nl_addr* addr = nullptr;
        if (nl_addr_parse(change.mac->c_str(), AF_LLC, &addr) < 0)
            throw HostCtlException("Invalid MAC address " + *change.mac);
        std::unique_ptr<nl_addr, AddrPut> owned(addr);
        rtnl_link_set_addr(wanted.get(), addr);
    }
    if (change.master) rtnl_link_set_master(wanted.get(), *change.master);
    nl_msg* message = nullptr;
    Check(rtnl_link_build_change_request(original.get(), wanted.get(), 0, &message),
          "cannot build a request to change a network device");
    return message;
}

void ChangeLink(const Namespace& ns, const std::string& name, const LinkChange& change) {
    if (change.Empty()) return;
    auto link = FindLink(ns, name);
    if (!link) throw HostCtlException("Network device " + name + " does not exist");
    Request(ns, BuildLinkChange(link->index, change), "Cannot change network device " + name);
}

}  // namespace TknCtl::Linux::Kernel

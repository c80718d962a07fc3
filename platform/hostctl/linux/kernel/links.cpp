#include "kernel/links.h"

#include <linux/if.h>
#include <linux/if_link.h>
#include <linux/ipv6.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/cache.h>
#include <netlink/msg.h>
#include <netlink/netlink.h>
#include <netlink/route/link.h>

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <iterator>
#include <memory>

#include "hostctl/exception.h"
#include "kernel/dryrun.h"
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

namespace {

// A link-layer address as libnl writes it: an address of 4 or 16 bytes (a tunnel's) as an IP
// address, others as hexadecimal pairs; empty when there is none.
std::string LinkAddressText(nlattr* attr) {
    if (!attr || nla_len(attr) <= 0) return {};
    std::size_t length = static_cast<std::size_t>(nla_len(attr));
    const auto* bytes = static_cast<const unsigned char*>(nla_data(attr));
    if (length == 4) return Kernel::AddressText(AF_INET, bytes, length);
    if (length == 16) return Kernel::AddressText(AF_INET6, bytes, length);
    static const char digits[] = "0123456789abcdef";
    std::string text;
    text.reserve(length * 3);
    for (std::size_t i = 0; i < length; ++i) {
        if (i) text += ':';
        text += digits[bytes[i] >> 4];
        text += digits[bytes[i] & 0xf];
    }
    return text;
}

const char* OperStateText(unsigned state) {
    static const char* const names[] = {"unknown", "notpresent", "down", "lowerlayerdown",
                                        "testing", "dormant",    "up"};
    return state < std::size(names) ? names[state] : "unknown";
}

}  // namespace

std::optional<Link> ParseLink(nl_msg* message) {
    return ParseLink(nlmsg_hdr(message));
}

std::optional<Link> ParseLink(const nlmsghdr* message) {
    // Read here rather than through libnl's objects: a listing of hundreds of devices costs
    // less than its objects would.
    auto* header = const_cast<nlmsghdr*>(message);
    if (header->nlmsg_type != RTM_NEWLINK || !nlmsg_valid_hdr(header, sizeof(ifinfomsg))) return std::nullopt;
    const auto* info = static_cast<const ifinfomsg*>(nlmsg_data(header));
    nlattr* tb[IFLA_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(ifinfomsg), tb, IFLA_MAX, nullptr) < 0 || !tb[IFLA_IFNAME])
        return std::nullopt;

    Link link;
    link.index = info->ifi_index;
    link.name = nla_get_string(tb[IFLA_IFNAME]);
    if (tb[IFLA_LINKINFO]) {
        nlattr* linkinfo[IFLA_INFO_MAX + 1] = {};
        if (nla_parse_nested(linkinfo, IFLA_INFO_MAX, tb[IFLA_LINKINFO], nullptr) == 0 &&
            linkinfo[IFLA_INFO_KIND])
            link.kind = nla_get_string(linkinfo[IFLA_INFO_KIND]);
    }
    link.mac = LinkAddressText(tb[IFLA_ADDRESS]);
    link.broadcast = LinkAddressText(tb[IFLA_BROADCAST]);
    auto u32 = [&](int type) { return tb[type] ? nla_get_u32(tb[type]) : 0u; };
    link.mtu = u32(IFLA_MTU);
    link.flags = info->ifi_flags;
    link.up = link.flags & IFF_UP;
    link.lowerUp = link.flags & IFF_LOWER_UP;
    link.loopback = link.flags & IFF_LOOPBACK;
    link.operState = OperStateText(tb[IFLA_OPERSTATE] ? nla_get_u8(tb[IFLA_OPERSTATE]) : 0);
    link.master = static_cast<int>(u32(IFLA_MASTER));
    link.peer = static_cast<int>(u32(IFLA_LINK));
    link.txQueueLength = u32(IFLA_TXQLEN);
    link.numTxQueues = u32(IFLA_NUM_TX_QUEUES);
    link.numRxQueues = u32(IFLA_NUM_RX_QUEUES);
    link.gsoMaxSize = u32(IFLA_GSO_MAX_SIZE);
    if (tb[IFLA_STATS64] &&
        nla_len(tb[IFLA_STATS64]) >= static_cast<int>(offsetof(rtnl_link_stats64, rx_compressed))) {
        rtnl_link_stats64 raw{};
        std::memcpy(&raw, nla_data(tb[IFLA_STATS64]),
                    std::min(sizeof(raw), static_cast<std::size_t>(nla_len(tb[IFLA_STATS64]))));
        auto& s = link.stats;
        s.rxPackets = raw.rx_packets;
        s.txPackets = raw.tx_packets;
        s.rxBytes = raw.rx_bytes;
        s.txBytes = raw.tx_bytes;
        s.rxErrors = raw.rx_errors;
        s.txErrors = raw.tx_errors;
        s.rxDropped = raw.rx_dropped;
        s.txDropped = raw.tx_dropped;
        s.multicast = raw.multicast;
        s.collisions = raw.collisions;
        s.rxLengthErrors = raw.rx_length_errors;
        s.rxOverErrors = raw.rx_over_errors;
        s.rxCrcErrors = raw.rx_crc_errors;
        s.rxFrameErrors = raw.rx_frame_errors;
        s.rxFifoErrors = raw.rx_fifo_errors;
        s.rxMissedErrors = raw.rx_missed_errors;
        s.txAbortedErrors = raw.tx_aborted_errors;
        s.txCarrierErrors = raw.tx_carrier_errors;
        s.txFifoErrors = raw.tx_fifo_errors;
        s.txHeartbeatErrors = raw.tx_heartbeat_errors;
        s.txWindowErrors = raw.tx_window_errors;
    }
    link.ipv6 = ParseIpv6Settings(header);
    return link;
}

std::vector<Link> ListLinks(const Namespace& ns, bool withStats) {
    std::vector<Link> links;
    // The request: the family header, then IFLA_EXT_MASK saying what to leave out.
    struct {
        ifinfomsg header;
        rtattr mask;
        std::uint32_t filter;
    } request{};
    static_assert(sizeof(request) == NLMSG_ALIGN(sizeof(ifinfomsg)) + RTA_LENGTH(sizeof(std::uint32_t)));
    request.header.ifi_family = AF_UNSPEC;
    request.mask.rta_type = IFLA_EXT_MASK;
    request.mask.rta_len = RTA_LENGTH(sizeof(std::uint32_t));
    request.filter = withStats ? 0 : RTEXT_FILTER_SKIP_STATS;
    Dump(
        ns, RTM_GETLINK, &request, sizeof(request), [&] { links.clear(); },
        [&](const nlmsghdr* message) {
            if (auto link = ParseLink(message)) links.push_back(std::move(*link));
        },
        "cannot list the network devices");
    std::sort(links.begin(), links.end(), [](const Link& a, const Link& b) { return a.index < b.index; });
    if (DryRun()) ApplyLinkPlans(LinkPlans(), ns.Name(), links);
    return links;
}

namespace {

std::optional<Link> FindKernelLink(const Namespace& ns, const std::string& name) {
    rtnl_link* object = nullptr;
    int error = rtnl_link_get_kernel(RouteSocket(ns), 0, name.c_str(), &object);
    if (error == -NLE_OBJ_NOTFOUND || error == -NLE_NODEV) return std::nullopt;
    Check(error, "cannot read network device " + name);
    LinkObject owned(object);
    return LinkFromObject(object);
}

}  // namespace

std::optional<Link> FindLink(const Namespace& ns, const std::string& name) {
    // A dry run's links as it would leave them (in a namespace it would make, its links only).
    if (IsPlannedNamespace(ns)) return ApplyLinkPlans(LinkPlans(), ns.Name(), name, std::nullopt);
    if (DryRun()) return ApplyLinkPlans(LinkPlans(), ns.Name(), name, FindKernelLink(ns, name));
    return FindKernelLink(ns, name);
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

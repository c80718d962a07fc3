#include "kernel/describe.h"

#include <arpa/inet.h>
#include <linux/ethtool.h>
#include <linux/ethtool_netlink.h>
#include <linux/genetlink.h>
#include <linux/if.h>
#include <linux/if_bridge.h>
#include <linux/if_link.h>
#include <linux/neighbour.h>
#include <linux/rtnetlink.h>
#include <linux/veth.h>
#include <linux/xfrm.h>
#include <netlink/attr.h>
#include <netlink/msg.h>

#include <cstdio>
#include <cstring>
#include <map>
#include <optional>
#include <vector>

#include "kernel/addresses.h"
#include "kernel/neighbours.h"
#include "kernel/resolv.h"
#include "kernel/routes.h"
#include "kernel/xfrm.h"

namespace TknCtl::Linux::Kernel {

namespace {

std::string OnOff(bool on) {
    return on ? "on" : "off";
}

std::string Mac(const nlattr* attr) {
    if (!attr || nla_len(attr) != 6) return {};
    const auto* bytes = static_cast<const unsigned char*>(nla_data(attr));
    char text[18];
    std::snprintf(text, sizeof(text), "%02x:%02x:%02x:%02x:%02x:%02x", bytes[0], bytes[1], bytes[2], bytes[3],
                  bytes[4], bytes[5]);
    return text;
}

std::string String(const nlattr* attr) {
    if (!attr) return {};
    const char* text = static_cast<const char*>(nla_data(attr));
    return std::string(text, strnlen(text, static_cast<std::size_t>(nla_len(attr))));
}

// The attributes of a message after its fixed header; false when they do not parse.
template <std::size_t N>
bool Attributes(const nlmsghdr* message, std::size_t fixed, nlattr* (&table)[N]) {
    auto* header = const_cast<nlmsghdr*>(message);
    if (!nlmsg_valid_hdr(header, static_cast<int>(fixed))) return false;
    return nlmsg_parse(header, static_cast<int>(fixed), table, N - 1, nullptr) >= 0;
}

template <std::size_t N>
bool Nested(const nlattr* nest, nlattr* (&table)[N]) {
    if (!nest) return false;
    return nla_parse_nested(table, N - 1, const_cast<nlattr*>(nest), nullptr) >= 0;
}

std::uint32_t U32(const nlattr* attr) {
    return nla_len(attr) >= 4 ? nla_get_u32(const_cast<nlattr*>(attr))
                              : (nla_len(attr) >= 1 ? nla_get_u8(const_cast<nlattr*>(attr)) : 0);
}

// A copy of a message whose type is changed: the readers of replies take only RTM_NEW...
std::vector<char> Retyped(const nlmsghdr* message, int type) {
    std::vector<char> copy(reinterpret_cast<const char*>(message),
                           reinterpret_cast<const char*>(message) + message->nlmsg_len);
    reinterpret_cast<nlmsghdr*>(copy.data())->nlmsg_type = static_cast<unsigned short>(type);
    return copy;
}

const char* Verb(int type) {
    switch (type) {
        case RTM_DELLINK:
        case RTM_DELADDR:
        case RTM_DELROUTE:
        case RTM_DELNEIGH:
            return "delete";
        default:
            return "add";
    }
}

// ---------------------------------------------------------------- links

std::string DescribeLink(const nlmsghdr* message, const DeviceNames& names) {
    const auto* info = static_cast<const ifinfomsg*>(nlmsg_data(const_cast<nlmsghdr*>(message)));
    nlattr* tb[IFLA_MAX + 1] = {};
    if (!Attributes(message, sizeof(ifinfomsg), tb)) return {};
    nlattr* linkinfo[IFLA_INFO_MAX + 1] = {};
    Nested(tb[IFLA_LINKINFO], linkinfo);
    const std::string kind = String(linkinfo[IFLA_INFO_KIND]);

    if (message->nlmsg_type == RTM_DELLINK) return "link delete " + names(info->ifi_index);
    std::string details;
    if (message->nlmsg_flags & NLM_F_CREATE) {
        std::string text = "link add " + String(tb[IFLA_IFNAME]);
        if (!kind.empty()) text += " type " + kind;
        if (tb[IFLA_MTU]) text += " mtu " + std::to_string(U32(tb[IFLA_MTU]));
        if (auto mac = Mac(tb[IFLA_ADDRESS]); !mac.empty()) text += " address " + mac;
        return text;
    }
    std::string text = "link set " + names(info->ifi_index);
    if (info->ifi_change & IFF_UP) text += (info->ifi_flags & IFF_UP) ? " up" : " down";
    if (tb[IFLA_MTU]) text += " mtu " + std::to_string(U32(tb[IFLA_MTU]));
    if (auto mac = Mac(tb[IFLA_ADDRESS]); !mac.empty()) text += " address " + mac;
    if (tb[IFLA_MASTER]) {
        const int master = static_cast<int>(U32(tb[IFLA_MASTER]));
        text += master == 0 ? " nomaster" : " master " + names(master);
    }
    if (!kind.empty()) {
        text += " type " + kind;
        nlattr* data[IFLA_BR_MAX + 1] = {};
        if (kind == "bridge" && Nested(linkinfo[IFLA_INFO_DATA], data)) {
            if (data[IFLA_BR_VLAN_FILTERING])
                text += " vlan_filtering " + std::to_string(U32(data[IFLA_BR_VLAN_FILTERING]));
            if (data[IFLA_BR_VLAN_STATS_ENABLED])
                text += " vlan_stats_enabled " + std::to_string(U32(data[IFLA_BR_VLAN_STATS_ENABLED]));
            if (data[IFLA_BR_VLAN_STATS_PER_PORT])
                text += " vlan_stats_per_port " + std::to_string(U32(data[IFLA_BR_VLAN_STATS_PER_PORT]));
        }
    }
    return text;
}

// A bridge port's flags (IFLA_PROTINFO) or VLANs (IFLA_AF_SPEC), family AF_BRIDGE.
std::string DescribeBridgePort(const nlmsghdr* message, const DeviceNames& names) {
    const auto* info = static_cast<const ifinfomsg*>(nlmsg_data(const_cast<nlmsghdr*>(message)));
    nlattr* tb[IFLA_MAX + 1] = {};
    if (!Attributes(message, sizeof(ifinfomsg), tb)) return {};
    const std::string device = names(info->ifi_index);
    nlattr* flags[IFLA_BRPORT_MAX + 1] = {};
    if (Nested(tb[IFLA_PROTINFO], flags)) {
        std::string text = "bridge port set " + device;
        auto flag = [&](int type, const char* name) {
            if (flags[type]) text += std::string(" ") + name + " " + OnOff(U32(flags[type]) != 0);
        };
        flag(IFLA_BRPORT_LEARNING, "learning");
        flag(IFLA_BRPORT_UNICAST_FLOOD, "flood");
        flag(IFLA_BRPORT_NEIGH_SUPPRESS, "neigh_suppress");
        flag(IFLA_BRPORT_LOCKED, "locked");
        return text;
    }
    if (!tb[IFLA_AF_SPEC]) return {};
    std::string vlans;
    std::string begin;  // the first VLAN of a range whose end is still to come
    nlattr* entry = nullptr;
    int rest = 0;
    nla_for_each_nested(entry, tb[IFLA_AF_SPEC], rest) {
        if (nla_type(entry) != IFLA_BRIDGE_VLAN_INFO ||
            nla_len(entry) < static_cast<int>(sizeof(bridge_vlan_info)))
            continue;
        bridge_vlan_info vlan{};
        std::memcpy(&vlan, nla_data(entry), sizeof(vlan));
        if (vlan.flags & BRIDGE_VLAN_INFO_RANGE_BEGIN) {
            begin = std::to_string(vlan.vid) + "-";
            continue;
        }
        std::string one = "vid " + begin + std::to_string(vlan.vid);
        begin.clear();
        if (vlan.flags & BRIDGE_VLAN_INFO_PVID) one += " pvid";
        if (vlan.flags & BRIDGE_VLAN_INFO_UNTAGGED) one += " untagged";
        vlans += (vlans.empty() ? "" : ", ") + one;
    }
    return std::string("bridge vlan ") + (message->nlmsg_type == RTM_DELLINK ? "delete" : "add") + " dev " +
           device + " " + vlans;
}

// ---------------------------------------------------------------- addresses, routes, neighbours

std::string TableName(unsigned table) {
    switch (table) {
        case RT_TABLE_MAIN:
            return "main";
        case RT_TABLE_LOCAL:
            return "local";
        case RT_TABLE_DEFAULT:
            return "default";
        default:
            return std::to_string(table);
    }
}

std::string ProtocolName(unsigned protocol) {
    switch (protocol) {
        case RTPROT_KERNEL:
            return "kernel";
        case RTPROT_BOOT:
            return "boot";
        case RTPROT_STATIC:
            return "static";
        case RTPROT_RA:
            return "ra";
        case RTPROT_DHCP:
            return "dhcp";
        default:
            return std::to_string(protocol);
    }
}

std::string DescribeAddress(const nlmsghdr* message, const DeviceNames& names) {
    auto copy = Retyped(message, RTM_NEWADDR);
    auto address = ParseAddress(reinterpret_cast<const nlmsghdr*>(copy.data()));
    if (!address) return {};
    return std::string("address ") + Verb(message->nlmsg_type) + " " + address->address + "/" +
           std::to_string(address->prefixLength) + " dev " + names(address->index);
}

std::string DescribeRoute(const nlmsghdr* message, const DeviceNames& names) {
    auto copy = Retyped(message, RTM_NEWROUTE);
    auto route = ParseRoute(reinterpret_cast<const nlmsghdr*>(copy.data()));
    if (!route) return {};
    std::string text = std::string("route ") + Verb(message->nlmsg_type) + " " + DescribeRoute(*route);
    if (!route->nexthops.empty() && route->nexthops.front().index != 0)
        text += " dev " + names(route->nexthops.front().index);
    text += " table " + TableName(route->table);
    if (route->metric != 0) text += " metric " + std::to_string(route->metric);
    if (route->protocol != 0) text += " proto " + ProtocolName(route->protocol);
    return text;
}

std::string DescribeNeighbour(const nlmsghdr* message, const DeviceNames& names) {
    nlattr* tb[NDA_MAX + 1] = {};
    if (!Attributes(message, sizeof(ndmsg), tb)) return {};
    const auto* info = static_cast<const ndmsg*>(nlmsg_data(const_cast<nlmsghdr*>(message)));
    if (info->ndm_family == AF_BRIDGE) {
        std::string text = std::string("fdb ") + Verb(message->nlmsg_type) + " " + Mac(tb[NDA_LLADDR]) +
                           " dev " + names(info->ndm_ifindex);
        if (info->ndm_flags & NTF_MASTER) text += " master";
        if (info->ndm_state & (NUD_NOARP | NUD_PERMANENT)) text += " static";
        return text;
    }
    auto copy = Retyped(message, RTM_NEWNEIGH);
    auto neighbour = ParseNeighbour(reinterpret_cast<const nlmsghdr*>(copy.data()));
    if (!neighbour) return {};
    return std::string("neighbour ") + Verb(message->nlmsg_type) + " " + neighbour->address + " dev " +
           names(neighbour->index);
}

// ---------------------------------------------------------------- xfrm

std::string AddressOf(int family, const xfrm_address_t& address) {
    char text[INET6_ADDRSTRLEN] = {};
    if (!inet_ntop(family, &address, text, sizeof(text))) return "?";
    return text;
}

std::string ProtocolOf(int protocol) {
    switch (protocol) {
        case 0:
            return "any";
        case IPPROTO_TCP:
            return "tcp";
        case IPPROTO_UDP:
            return "udp";
        case IPPROTO_ICMPV6:
            return "ipv6-icmp";
        case IPPROTO_ICMP:
            return "icmp";
        case kXfrmEsp:
            return "esp";
        case kXfrmAh:
            return "ah";
        default:
            return std::to_string(protocol);
    }
}

std::string ModeOf(int mode) {
    return mode == kXfrmTunnel ? "tunnel" : "transport";
}

std::string Spi(std::uint32_t spi) {
    char text[16];
    std::snprintf(text, sizeof(text), "0x%08x", spi);
    return text;
}

std::string DirectionOf(int direction) {
    switch (direction) {
        case kXfrmIn:
            return "in";
        case kXfrmOut:
            return "out";
        case kXfrmForward:
            return "fwd";
        default:
            return std::to_string(direction);
    }
}

// ---------------------------------------------------------------- ethtool

struct EthtoolCommand {
    const char* name;
    std::map<int, const char*> attributes;
};

const std::map<int, EthtoolCommand>& EthtoolCommands() {
    static const std::map<int, EthtoolCommand> commands{
        {ETHTOOL_MSG_LINKINFO_SET,
         {"linkinfo",
          {{ETHTOOL_A_LINKINFO_PORT, "port"},
           {ETHTOOL_A_LINKINFO_PHYADDR, "phyad"},
           {ETHTOOL_A_LINKINFO_TP_MDIX_CTRL, "mdix"},
           {ETHTOOL_A_LINKINFO_TRANSCEIVER, "xcvr"}}}},
        {ETHTOOL_MSG_LINKMODES_SET,
         {"linkmodes",
          {{ETHTOOL_A_LINKMODES_AUTONEG, "autoneg"},
           {ETHTOOL_A_LINKMODES_SPEED, "speed"},
           {ETHTOOL_A_LINKMODES_DUPLEX, "duplex"},
           {ETHTOOL_A_LINKMODES_LANES, "lanes"}}}},
        {ETHTOOL_MSG_PAUSE_SET,
         {"pause",
          {{ETHTOOL_A_PAUSE_AUTONEG, "autoneg"}, {ETHTOOL_A_PAUSE_RX, "rx"}, {ETHTOOL_A_PAUSE_TX, "tx"}}}},
        {ETHTOOL_MSG_RINGS_SET,
         {"rings",
          {{ETHTOOL_A_RINGS_RX, "rx"},
           {ETHTOOL_A_RINGS_RX_MINI, "rx-mini"},
           {ETHTOOL_A_RINGS_RX_JUMBO, "rx-jumbo"},
           {ETHTOOL_A_RINGS_TX, "tx"}}}},
        {ETHTOOL_MSG_CHANNELS_SET,
         {"channels",
          {{ETHTOOL_A_CHANNELS_RX_COUNT, "rx"},
           {ETHTOOL_A_CHANNELS_TX_COUNT, "tx"},
           {ETHTOOL_A_CHANNELS_OTHER_COUNT, "other"},
           {ETHTOOL_A_CHANNELS_COMBINED_COUNT, "combined"}}}},
        {ETHTOOL_MSG_COALESCE_SET,
         {"coalesce",
          {{ETHTOOL_A_COALESCE_RX_USECS, "rx-usecs"},
           {ETHTOOL_A_COALESCE_RX_MAX_FRAMES, "rx-frames"},
           {ETHTOOL_A_COALESCE_RX_USECS_IRQ, "rx-usecs-irq"},
           {ETHTOOL_A_COALESCE_RX_MAX_FRAMES_IRQ, "rx-frames-irq"},
           {ETHTOOL_A_COALESCE_TX_USECS, "tx-usecs"},
           {ETHTOOL_A_COALESCE_TX_MAX_FRAMES, "tx-frames"},
           {ETHTOOL_A_COALESCE_TX_USECS_IRQ, "tx-usecs-irq"},
           {ETHTOOL_A_COALESCE_TX_MAX_FRAMES_IRQ, "tx-frames-irq"},
           {ETHTOOL_A_COALESCE_STATS_BLOCK_USECS, "stats-block-usecs"},
           {ETHTOOL_A_COALESCE_USE_ADAPTIVE_RX, "adaptive-rx"},
           {ETHTOOL_A_COALESCE_USE_ADAPTIVE_TX, "adaptive-tx"},
           {ETHTOOL_A_COALESCE_PKT_RATE_LOW, "pkt-rate-low"},
           {ETHTOOL_A_COALESCE_RX_USECS_LOW, "rx-usecs-low"},
           {ETHTOOL_A_COALESCE_RX_MAX_FRAMES_LOW, "rx-frames-low"},
           {ETHTOOL_A_COALESCE_TX_USECS_LOW, "tx-usecs-low"},
           {ETHTOOL_A_COALESCE_TX_MAX_FRAMES_LOW, "tx-frames-low"},
           {ETHTOOL_A_COALESCE_PKT_RATE_HIGH, "pkt-rate-high"},
           {ETHTOOL_A_COALESCE_RX_USECS_HIGH, "rx-usecs-high"},
           {ETHTOOL_A_COALESCE_RX_MAX_FRAMES_HIGH, "rx-frames-high"},
           {ETHTOOL_A_COALESCE_TX_USECS_HIGH, "tx-usecs-high"},
           {ETHTOOL_A_COALESCE_TX_MAX_FRAMES_HIGH, "tx-frames-high"},
           {ETHTOOL_A_COALESCE_RATE_SAMPLE_INTERVAL, "sample-interval"}}}},
        {ETHTOOL_MSG_WOL_SET, {"wol", {}}},
        {ETHTOOL_MSG_DEBUG_SET, {"debug", {}}},
        {ETHTOOL_MSG_FEATURES_SET, {"features", {}}},
    };
    return commands;
}

// Wake-on modes as ethtool's letters ("d": none).
std::string WakeOnLetters(std::uint32_t modes) {
    static const std::pair<std::uint32_t, char> kLetters[] = {
        {WAKE_PHY, 'p'}, {WAKE_UCAST, 'u'}, {WAKE_MCAST, 'm'},       {WAKE_BCAST, 'b'},
        {WAKE_ARP, 'a'}, {WAKE_MAGIC, 'g'}, {WAKE_MAGICSECURE, 's'}, {WAKE_FILTER, 'f'},
    };
    std::string text;
    for (const auto& [bit, letter] : kLetters) {
        if (modes & bit) text += letter;
    }
    return text.empty() ? "d" : text;
}

// A bit set of a SET request: the first word of a compact value, or the named bits of a list.
std::string BitsetText(const nlattr* set, bool wakeOn) {
    nlattr* tb[ETHTOOL_A_BITSET_MAX + 1] = {};
    if (!Nested(set, tb)) return "?";
    if (tb[ETHTOOL_A_BITSET_VALUE] && nla_len(tb[ETHTOOL_A_BITSET_VALUE]) >= 4) {
        std::uint32_t word = 0;
        std::memcpy(&word, nla_data(tb[ETHTOOL_A_BITSET_VALUE]), sizeof(word));
        if (wakeOn) return WakeOnLetters(word);
        char text[16];
        std::snprintf(text, sizeof(text), "0x%x", word);
        return text;
    }
    std::string text;
    nlattr* bit = nullptr;
    int rest = 0;
    if (!tb[ETHTOOL_A_BITSET_BITS]) return "?";
    nla_for_each_nested(bit, tb[ETHTOOL_A_BITSET_BITS], rest) {
        nlattr* one[ETHTOOL_A_BITSET_BIT_MAX + 1] = {};
        if (!Nested(bit, one)) continue;
        std::string name = one[ETHTOOL_A_BITSET_BIT_NAME]
                               ? String(one[ETHTOOL_A_BITSET_BIT_NAME])
                               : (one[ETHTOOL_A_BITSET_BIT_INDEX]
                                      ? "bit" + std::to_string(U32(one[ETHTOOL_A_BITSET_BIT_INDEX]))
                                      : std::string("?"));
        text += (text.empty() ? "" : " ") + name + " " + OnOff(one[ETHTOOL_A_BITSET_BIT_VALUE] != nullptr);
    }
    return text;
}

}  // namespace

std::string DescribeRouteRequest(const nlmsghdr* request, const DeviceNames& names) {
    switch (request->nlmsg_type) {
        case RTM_NEWLINK:
        case RTM_SETLINK:
        case RTM_DELLINK: {
            if (!nlmsg_valid_hdr(const_cast<nlmsghdr*>(request), sizeof(ifinfomsg))) return {};
            const auto* info = static_cast<const ifinfomsg*>(nlmsg_data(const_cast<nlmsghdr*>(request)));
            return info->ifi_family == AF_BRIDGE ? DescribeBridgePort(request, names)
                                                 : DescribeLink(request, names);
        }
        case RTM_NEWADDR:
        case RTM_DELADDR:
            return DescribeAddress(request, names);
        case RTM_NEWROUTE:
        case RTM_DELROUTE:
            return DescribeRoute(request, names);
        case RTM_NEWNEIGH:
        case RTM_DELNEIGH:
            return DescribeNeighbour(request, names);
        default:
            return {};
    }
}

std::string DescribeVethAdd(const VethPair& pair, const std::string& peerNetstack) {
    auto details = [](const VethEnd& end) {
        std::string text;
        if (end.mtu) text += " mtu " + std::to_string(end.mtu);
        if (!end.mac.empty()) text += " address " + end.mac;
        if (end.rxQueues) text += " numrxqueues " + std::to_string(end.rxQueues);
        if (end.gsoMaxSize) text += " gso_max_size " + std::to_string(end.gsoMaxSize);
        return text;
    };
    std::string text = "link add " + pair.end.name + " type veth" + details(pair.end) + " peer " +
                       pair.peer.name + details(pair.peer);
    if (!peerNetstack.empty()) text += " in netstack " + peerNetstack;
    return text;
}

std::string DescribeTokenBucket(const std::string& device, const TokenBucket& bucket) {
    std::string text = "qdisc replace dev " + device + " root tbf rate " + std::to_string(bucket.rate) +
                       " bytes/s burst " + std::to_string(bucket.burst) + " bytes";
    if (bucket.peakRate) {
        text += " peakrate " + std::to_string(bucket.peakRate) + " bytes/s mtu " +
                std::to_string(bucket.peakBucket) + " bytes";
    }
    return text + " limit " + std::to_string(bucket.limit) + " bytes";
}

std::string DescribeRootDelete(const std::string& device) {
    return "qdisc delete dev " + device + " root";
}

std::string DescribeXfrmRequest(nl_msg* request) {
    nlmsghdr* header = nlmsg_hdr(request);
    switch (header->nlmsg_type) {
        case XFRM_MSG_NEWSA: {
            auto state = ParseState(request);
            if (!state) return {};
            std::string text = "xfrm state add src " + state->source + " dst " + state->destination +
                               " proto " + ProtocolOf(state->protocol) + " spi " + Spi(state->spi) +
                               " mode " + ModeOf(state->mode);
            // The keys stay in the request.
            if (state->encryption) text += " enc " + state->encryption->name;
            if (state->integrity) text += " auth " + state->integrity->name;
            if (state->lifetimeSeconds) text += " lifetime " + std::to_string(state->lifetimeSeconds) + "s";
            return text;
        }
        case XFRM_MSG_DELSA: {
            if (!nlmsg_valid_hdr(header, sizeof(xfrm_usersa_id))) return {};
            const auto* id = static_cast<const xfrm_usersa_id*>(nlmsg_data(header));
            return "xfrm state delete dst " + AddressOf(id->family, id->daddr) + " proto " +
                   ProtocolOf(id->proto) + " spi " + Spi(ntohl(id->spi));
        }
        case XFRM_MSG_NEWPOLICY: {
            auto policy = ParsePolicy(request);
            if (!policy) return {};
            const auto& s = policy->selector;
            std::string text = "xfrm policy add src " + s.source + "/" + std::to_string(s.sourcePrefix) +
                               " dst " + s.destination + "/" + std::to_string(s.destinationPrefix);
            if (s.protocol) text += " proto " + ProtocolOf(s.protocol);
            if (s.sourcePort) text += " sport " + std::to_string(s.sourcePort);
            if (s.destinationPort) text += " dport " + std::to_string(s.destinationPort);
            text += " dir " + DirectionOf(policy->direction) + " action " +
                    (policy->action == kXfrmBlock ? "block" : "allow");
            for (const auto& t : policy->templates) {
                text += " tmpl " + ProtocolOf(t.protocol) + " " + ModeOf(t.mode);
                if (t.spi) text += " spi " + Spi(t.spi);
            }
            return text;
        }
        case XFRM_MSG_DELPOLICY: {
            if (!nlmsg_valid_hdr(header, sizeof(xfrm_userpolicy_id))) return {};
            const auto* id = static_cast<const xfrm_userpolicy_id*>(nlmsg_data(header));
            return "xfrm policy delete dir " + DirectionOf(id->dir) + " index " + std::to_string(id->index);
        }
        default:
            return {};
    }
}

std::string DescribeEthtoolRequest(nl_msg* request) {
    nlmsghdr* header = nlmsg_hdr(request);
    if (!nlmsg_valid_hdr(header, GENL_HDRLEN)) return {};
    const auto* genl = static_cast<const genlmsghdr*>(nlmsg_data(header));
    const auto& commands = EthtoolCommands();
    auto command = commands.find(genl->cmd);
    if (command == commands.end()) return {};
    nlattr* tb[64] = {};
    if (nlmsg_parse(header, GENL_HDRLEN, tb, 63, nullptr) < 0) return {};
    nlattr* head[ETHTOOL_A_HEADER_MAX + 1] = {};
    Nested(tb[1], head);  // every request's header is its attribute 1
    std::string text =
        std::string("ethtool ") + command->second.name + " set " + String(head[ETHTOOL_A_HEADER_DEV_NAME]);
    for (int type = 2; type < 64; ++type) {
        if (!tb[type]) continue;
        if (genl->cmd == ETHTOOL_MSG_WOL_SET && type == ETHTOOL_A_WOL_MODES) {
            text += " wol " + BitsetText(tb[type], true);
        } else if (genl->cmd == ETHTOOL_MSG_DEBUG_SET && type == ETHTOOL_A_DEBUG_MSGMASK) {
            text += " msglvl " + BitsetText(tb[type], false);
        } else if (genl->cmd == ETHTOOL_MSG_FEATURES_SET && type == ETHTOOL_A_FEATURES_WANTED) {
            text += " " + BitsetText(tb[type], false);
        } else {
            auto name = command->second.attributes.find(type);
            text += " " +
                    (name == command->second.attributes.end() ? "attribute" + std::to_string(type)
                                                              : std::string(name->second)) +
                    " " + std::to_string(U32(tb[type]));
        }
    }
    return text;
}

std::string DescribeFirewall(const NftFirewall& firewall) {
    std::string text =
        std::string("nftables replace table ") + kFirewallFamily + " " + kFirewallTable + " (input ";
    text += firewall.enabled ? std::string("policy ") + (firewall.pass ? "accept" : "drop")
                             : "accepts everything";
    for (const auto& ruleset : firewall.rulesets) {
        text += "; " + ruleset.name + ": " + std::to_string(ruleset.rules.size()) +
                (ruleset.rules.size() == 1 ? " rule" : " rules") + ", ";
        if (ruleset.allowedAll) {
            text += "all addresses";
        } else {
            std::string allowed;
            for (const auto& entry : ruleset.allowed)
                allowed += (allowed.empty() ? "" : " ") + entry;
            text += allowed.empty() ? "no address" : "from " + allowed;
        }
    }
    if (!firewall.dynamicRules.empty())
        text += "; " + std::to_string(firewall.dynamicRules.size()) + " dynamic rule" +
                (firewall.dynamicRules.size() == 1 ? "" : "s");
    return text + ")";
}

std::string DescribeFirewallDelete() {
    return std::string("nftables delete table ") + kFirewallFamily + " " + kFirewallTable;
}

std::string DescribeSysctl(const std::string& name, const std::string& value) {
    std::string dotted = name;
    for (auto& c : dotted) {
        if (c == '/') c = '.';
    }
    return "sysctl net." + dotted + " = " + value;
}

std::string DescribeResolvConf(const std::string& path, const std::string& text) {
    const auto config = ParseResolvConf(text);
    std::string what;
    for (const auto& server : config.servers)
        what += (what.empty() ? "" : ", ") + std::string("nameserver ") + server;
    if (!config.searchDomains.empty()) {
        std::string domains;
        for (const auto& domain : config.searchDomains)
            domains += (domains.empty() ? "" : " ") + domain;
        what += (what.empty() ? "" : ", ") + std::string("search ") + domains;
    }
    return "file write " + path + " (" + (what.empty() ? "no name server, no search domain" : what) + ")";
}

}  // namespace TknCtl::Linux::Kernel

#include "kernel/bridges.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <linux/if.h>
#include <linux/if_addr.h>
#include <linux/if_bridge.h>
#include <linux/if_link.h>
#include <linux/neighbour.h>
#include <linux/net_namespace.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <netlink/netlink.h>
#include <netlink/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>

#include "hostctl/exception.h"
#include "kernel/dryrun.h"
#include "kernel/request.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};
using Message = std::unique_ptr<nl_msg, MessageFree>;
struct CallbackPut {
    void operator()(nl_cb* cb) const { nl_cb_put(cb); }
};

nl_msg* NewMessage(int type, int flags) {
    nl_msg* message = nlmsg_alloc_simple(type, flags);
    if (!message) throw HostCtlException("out of memory");
    return message;
}

// The header of a link request; the message is freed when a step fails.
Message LinkRequest(int type, int flags, int family, int index) {
    Message message(NewMessage(type, flags));
    ifinfomsg header{};
    header.ifi_family = static_cast<unsigned char>(family);
    header.ifi_index = index;
    if (nlmsg_append(message.get(), &header, sizeof(header), NLMSG_ALIGNTO) < 0)
        throw HostCtlException("out of memory");
    return message;
}

// A nested attribute that says so (NLA_F_NESTED): the bridge reads an IFLA_PROTINFO without the
// flag as the port state byte of old.
nlattr* Nest(nl_msg* message, int type) {
    nlattr* nest = nla_nest_start(message, type);
    if (!nest) throw HostCtlException("out of memory");
    nest->nla_type |= NLA_F_NESTED;
    return nest;
}

void Put(int error) {
    if (error < 0) throw HostCtlException("cannot build a request to the kernel: " + ErrorText(error));
}

std::string MacText(const nlattr* attr) {
    if (!attr || nla_len(attr) != 6) return {};
    const auto* bytes = static_cast<const unsigned char*>(nla_data(attr));
    char text[18];
    std::snprintf(text, sizeof(text), "%02x:%02x:%02x:%02x:%02x:%02x", bytes[0], bytes[1], bytes[2], bytes[3],
                  bytes[4], bytes[5]);
    return text;
}

bool MacBytes(const std::string& text, unsigned char (&bytes)[6]) {
    unsigned values[6];
    char rest = 0;
    if (std::sscanf(text.c_str(), "%2x:%2x:%2x:%2x:%2x:%2x%c", &values[0], &values[1], &values[2], &values[3],
                    &values[4], &values[5], &rest) != 6 ||
        text.size() != 17)
        return false;
    for (int i = 0; i < 6; ++i)
        bytes[i] = static_cast<unsigned char>(values[i]);
    return true;
}

std::string String(const nlattr* attr) {
    if (!attr) return {};
    const char* text = static_cast<const char*>(nla_data(attr));
    return std::string(text, strnlen(text, static_cast<std::size_t>(nla_len(attr))));
}

bool Flag(const nlattr* attr, bool fallback) {
    return attr ? nla_get_u8(const_cast<nlattr*>(attr)) != 0 : fallback;
}

int CollectMessage(nl_msg* message, void* arg) {
    auto* out = static_cast<std::vector<Message>*>(arg);
    if (nl_msg* copy = nlmsg_convert(nlmsg_hdr(message))) out->emplace_back(copy);
    return NL_OK;
}

int Acknowledged(nl_msg*, void* arg) {
    *static_cast<bool*>(arg) = true;
    return NL_STOP;
}

// Sends a request (taking it) and gathers the replies: the parts of a dump, or the answer of a
// request and the acknowledgement that follows it (which keeps the socket's sequence numbers
// in step for the next request).
std::vector<Message> Exchange(const Namespace& ns, Message request, const std::string& what, bool dump) {
    if (IsPlannedNamespace(ns)) return {};  // a namespace a dry run would make holds nothing yet
    nl_sock* sock = RouteSocket(ns);
    Check(nl_send_auto(sock, request.get()), what);
    // The socket's own callbacks stay as they are: the replies are read through a copy.
    std::unique_ptr<nl_cb, CallbackPut> own(nl_socket_get_cb(sock));  // a reference of our own
    std::unique_ptr<nl_cb, CallbackPut> cb(nl_cb_clone(own.get()));
    if (!cb) throw HostCtlException(what + ": out of memory");
    std::vector<Message> replies;
    bool acknowledged = false;
    nl_cb_set(cb.get(), NL_CB_VALID, NL_CB_CUSTOM, CollectMessage, &replies);
    nl_cb_set(cb.get(), NL_CB_ACK, NL_CB_CUSTOM, Acknowledged, &acknowledged);
    Check(nl_recvmsgs(sock, cb.get()), what);
    while (!dump && !acknowledged)
        Check(nl_recvmsgs(sock, cb.get()), what);
    return replies;
}

// Sends a change and waits for the kernel's answer.
void Send(const Namespace& ns, nl_msg* request, const std::string& what) {
    if (DryRun()) {
        Message owned(request);
        return RehearseRequest(ns, nlmsg_hdr(request));
    }
    Check(nl_send_sync(RouteSocket(ns), request), what);  // frees the request
    Changed();                                            // what was read of the kernel before is read again
}

Message Dump(int type, int family, std::size_t headerSize) {
    Message message(NewMessage(type, NLM_F_REQUEST | NLM_F_DUMP));
    std::vector<unsigned char> header(headerSize, 0);
    header[0] = static_cast<unsigned char>(family);  // every header starts with its family
    if (nlmsg_append(message.get(), header.data(), header.size(), NLMSG_ALIGNTO) < 0)
        throw HostCtlException("out of memory");
    return message;
}

std::string In(const Namespace& ns) {
    return ns.IsOwn() ? std::string() : " in namespace " + ns.Name();
}

}  // namespace

// ---------------------------------------------------------------- links

std::optional<BridgeLink> ParseBridgeLink(nl_msg* message) {
    nlmsghdr* header = nlmsg_hdr(message);
    if (header->nlmsg_type != RTM_NEWLINK || !nlmsg_valid_hdr(header, sizeof(ifinfomsg))) return std::nullopt;
    const auto* info = static_cast<const ifinfomsg*>(nlmsg_data(header));
    nlattr* attrs[IFLA_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(ifinfomsg), attrs, IFLA_MAX, nullptr) < 0) return std::nullopt;

    BridgeLink link;
    link.index = info->ifi_index;
    link.up = info->ifi_flags & IFF_UP;
    link.name = String(attrs[IFLA_IFNAME]);
    link.mac = MacText(attrs[IFLA_ADDRESS]);
    if (attrs[IFLA_MTU]) link.mtu = nla_get_u32(attrs[IFLA_MTU]);
    if (attrs[IFLA_MASTER]) link.master = static_cast<int>(nla_get_u32(attrs[IFLA_MASTER]));
    if (attrs[IFLA_LINK]) link.peer = static_cast<int>(nla_get_u32(attrs[IFLA_LINK]));
    if (attrs[IFLA_LINK_NETNSID])
        link.peerNamespaceId = static_cast<int>(nla_get_s32(attrs[IFLA_LINK_NETNSID]));
    if (link.peer == link.index && !link.peerNamespaceId) link.peer = 0;  // a device is its own link

    if (!attrs[IFLA_LINKINFO]) return link;
    nlattr* linkInfo[IFLA_INFO_MAX + 1] = {};
    if (nla_parse_nested(linkInfo, IFLA_INFO_MAX, attrs[IFLA_LINKINFO], nullptr) < 0) return link;
    link.kind = String(linkInfo[IFLA_INFO_KIND]);
    link.masterKind = String(linkInfo[IFLA_INFO_SLAVE_KIND]);

    if (link.kind == "bridge") {
        BridgeInfo bridge;
        nlattr* data[IFLA_BR_MAX + 1] = {};
        if (linkInfo[IFLA_INFO_DATA] &&
            nla_parse_nested(data, IFLA_BR_MAX, linkInfo[IFLA_INFO_DATA], nullptr) >= 0) {
            bridge.vlanFiltering = Flag(data[IFLA_BR_VLAN_FILTERING], false);
            bridge.vlanFilteringAvailable = data[IFLA_BR_VLAN_DEFAULT_PVID] != nullptr;
            if (data[IFLA_BR_VLAN_DEFAULT_PVID])
                bridge.defaultPvid = nla_get_u16(data[IFLA_BR_VLAN_DEFAULT_PVID]);
            if (data[IFLA_BR_STP_STATE]) bridge.stp = nla_get_u32(data[IFLA_BR_STP_STATE]) != 0;
        }
        link.bridge = bridge;
    }
    if (link.masterKind == "bridge") {
        PortInfo port;
        nlattr* data[IFLA_BRPORT_MAX + 1] = {};
        if (linkInfo[IFLA_INFO_SLAVE_DATA] &&
            nla_parse_nested(data, IFLA_BRPORT_MAX, linkInfo[IFLA_INFO_SLAVE_DATA], nullptr) >= 0) {
            if (data[IFLA_BRPORT_STATE]) port.state = nla_get_u8(data[IFLA_BRPORT_STATE]);
            port.learning = Flag(data[IFLA_BRPORT_LEARNING], true);
            port.unicastFlood = Flag(data[IFLA_BRPORT_UNICAST_FLOOD], true);
            port.neighSuppress = Flag(data[IFLA_BRPORT_NEIGH_SUPPRESS], false);
            port.hasLocked = data[IFLA_BRPORT_LOCKED] != nullptr;
            port.locked = Flag(data[IFLA_BRPORT_LOCKED], false);
        }
        link.port = port;
    }
    return link;
}

std::vector<BridgeLink> ListBridgeLinks(const Namespace& ns) {
    auto replies = Exchange(ns, Dump(RTM_GETLINK, AF_UNSPEC, sizeof(ifinfomsg)),
                            "cannot list the network devices" + In(ns), true);
    std::vector<BridgeLink> links;
    links.reserve(replies.size());
    for (const auto& reply : replies) {
        if (auto link = ParseBridgeLink(reply.get())) links.push_back(std::move(*link));
    }
    if (DryRun()) ApplyLinkPlans(LinkPlans(), ns.Name(), links);
    return links;
}

nl_msg* BuildBridgeAdd(const std::string& name, unsigned mtu, int index) {
    Message message = LinkRequest(RTM_NEWLINK, NLM_F_REQUEST | NLM_F_CREATE | NLM_F_EXCL, AF_UNSPEC, index);
    Put(nla_put_string(message.get(), IFLA_IFNAME, name.c_str()));
    Put(nla_put_u32(message.get(), IFLA_MTU, mtu));
    nlattr* info = Nest(message.get(), IFLA_LINKINFO);
    Put(nla_put_string(message.get(), IFLA_INFO_KIND, "bridge"));
    nla_nest_end(message.get(), info);
    return message.release();
}

void AddBridge(const Namespace& ns, const std::string& name, unsigned mtu, int index) {
    Send(ns, BuildBridgeAdd(name, mtu, index), "Cannot create bridge " + name + In(ns));
}

nl_msg* BuildLinkDelete(int index) {
    return LinkRequest(RTM_DELLINK, NLM_F_REQUEST, AF_UNSPEC, index).release();
}

void DeleteLink(const Namespace& ns, int index, const std::string& name) {
    Send(ns, BuildLinkDelete(index), "Cannot delete network device " + name + In(ns));
}

nl_msg* BuildBridgeVlanFiltering(int bridgeIndex, bool on) {
    Message message = LinkRequest(RTM_NEWLINK, NLM_F_REQUEST, AF_UNSPEC, bridgeIndex);
    nlattr* info = Nest(message.get(), IFLA_LINKINFO);
    Put(nla_put_string(message.get(), IFLA_INFO_KIND, "bridge"));
    nlattr* data = Nest(message.get(), IFLA_INFO_DATA);
    Put(nla_put_u8(message.get(), IFLA_BR_VLAN_FILTERING, on ? 1 : 0));
    nla_nest_end(message.get(), data);
    nla_nest_end(message.get(), info);
    return message.release();
}

void SetBridgeVlanFiltering(const Namespace& ns, int bridgeIndex, const std::string& name, bool on) {
    Send(ns, BuildBridgeVlanFiltering(bridgeIndex, on),
         "Cannot turn " + std::string(on ? "on" : "off") + " VLAN filtering of bridge " + name);
}

// ---------------------------------------------------------------- port flags and VLANs

nl_msg* BuildPortFlags(int portIndex, const PortFlagsChange& change) {
    Message message = LinkRequest(RTM_SETLINK, NLM_F_REQUEST, AF_BRIDGE, portIndex);
    nlattr* info = Nest(message.get(), IFLA_PROTINFO);
    auto flag = [&](int type, const std::optional<bool>& value) {
        if (value) Put(nla_put_u8(message.get(), type, *value ? 1 : 0));
    };
    flag(IFLA_BRPORT_LEARNING, change.learning);
    flag(IFLA_BRPORT_UNICAST_FLOOD, change.unicastFlood);
    flag(IFLA_BRPORT_NEIGH_SUPPRESS, change.neighSuppress);
    flag(IFLA_BRPORT_LOCKED, change.locked);
    nla_nest_end(message.get(), info);
    return message.release();
}

void ChangePortFlags(const Namespace& ns, int portIndex, const std::string& name,
                     const PortFlagsChange& change) {
    if (change.Empty()) return;
    Send(ns, BuildPortFlags(portIndex, change), "Cannot change the bridge port flags of " + name);
}

nl_msg* BuildPortVlans(int portIndex, const std::vector<PortVlan>& vlans, bool add) {
    Message message = LinkRequest(add ? RTM_SETLINK : RTM_DELLINK, NLM_F_REQUEST, AF_BRIDGE, portIndex);
    nlattr* afSpec = Nest(message.get(), IFLA_AF_SPEC);
    Put(nla_put_u16(message.get(), IFLA_BRIDGE_FLAGS, BRIDGE_FLAGS_MASTER));
    for (const auto& vlan : vlans) {
        bridge_vlan_info info{};
        info.flags = static_cast<__u16>((vlan.pvid ? BRIDGE_VLAN_INFO_PVID : 0) |
                                        (vlan.untagged ? BRIDGE_VLAN_INFO_UNTAGGED : 0));
        if (vlan.lastVid > vlan.vid) {
            bridge_vlan_info first = info, last = info;
            first.flags |= BRIDGE_VLAN_INFO_RANGE_BEGIN;
            first.vid = vlan.vid;
            last.flags |= BRIDGE_VLAN_INFO_RANGE_END;
            last.vid = vlan.lastVid;
            Put(nla_put(message.get(), IFLA_BRIDGE_VLAN_INFO, sizeof(first), &first));
            Put(nla_put(message.get(), IFLA_BRIDGE_VLAN_INFO, sizeof(last), &last));
        } else {
            info.vid = vlan.vid;
            Put(nla_put(message.get(), IFLA_BRIDGE_VLAN_INFO, sizeof(info), &info));
        }
    }
    nla_nest_end(message.get(), afSpec);
    return message.release();
}

void ChangePortVlans(const Namespace& ns, int portIndex, const std::string& name,
                     const std::vector<PortVlan>& vlans, bool add) {
    if (vlans.empty()) return;
    Send(ns, BuildPortVlans(portIndex, vlans, add),
         std::string("Cannot ") + (add ? "add" : "remove") + " VLANs of bridge port " + name);
}

std::optional<std::pair<int, std::vector<PortVlan>>> ParsePortVlans(nl_msg* message) {
    nlmsghdr* header = nlmsg_hdr(message);
    if (header->nlmsg_type != RTM_NEWLINK || !nlmsg_valid_hdr(header, sizeof(ifinfomsg))) return std::nullopt;
    const auto* info = static_cast<const ifinfomsg*>(nlmsg_data(header));
    if (info->ifi_family != AF_BRIDGE) return std::nullopt;
    nlattr* attrs[IFLA_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(ifinfomsg), attrs, IFLA_MAX, nullptr) < 0 || !attrs[IFLA_AF_SPEC])
        return std::nullopt;
    std::vector<PortVlan> vlans;
    std::optional<PortVlan> open;  // a range whose end is still to come
    nlattr* entry = nullptr;
    int rest = 0;
    nla_for_each_nested(entry, attrs[IFLA_AF_SPEC], rest) {
        if (nla_type(entry) != IFLA_BRIDGE_VLAN_INFO ||
            nla_len(entry) < static_cast<int>(sizeof(bridge_vlan_info)))
            continue;
        bridge_vlan_info vinfo{};
        std::memcpy(&vinfo, nla_data(entry), sizeof(vinfo));
        PortVlan vlan;
        vlan.vid = vinfo.vid;
        vlan.pvid = vinfo.flags & BRIDGE_VLAN_INFO_PVID;
        vlan.untagged = vinfo.flags & BRIDGE_VLAN_INFO_UNTAGGED;
        if (vinfo.flags & BRIDGE_VLAN_INFO_RANGE_BEGIN) {
            open = vlan;
        } else if ((vinfo.flags & BRIDGE_VLAN_INFO_RANGE_END) && open) {
            open->lastVid = vinfo.vid;
            vlans.push_back(*open);
            open.reset();
        } else {
            vlans.push_back(vlan);
        }
    }
    return std::make_pair(info->ifi_index, std::move(vlans));
}

nl_msg* BuildPortVlanDump() {
    Message message = Dump(RTM_GETLINK, AF_BRIDGE, sizeof(ifinfomsg));
    Put(nla_put_u32(message.get(), IFLA_EXT_MASK, RTEXT_FILTER_BRVLAN));
    return message.release();
}

std::vector<std::pair<int, std::vector<PortVlan>>> ListPortVlans(const Namespace& ns) {
    auto replies = Exchange(ns, Message(BuildPortVlanDump()),
                            "cannot list the VLANs of the bridge ports" + In(ns), true);
    std::vector<std::pair<int, std::vector<PortVlan>>> ports;
    for (const auto& reply : replies) {
        if (auto port = ParsePortVlans(reply.get())) ports.push_back(std::move(*port));
    }
    return ports;
}

// ---------------------------------------------------------------- forwarding entries

nl_msg* BuildStaticEntry(int portIndex, const std::string& mac, bool add) {
    unsigned char bytes[6];
    if (!MacBytes(mac, bytes)) throw HostCtlException("Invalid MAC address " + mac);
    Message message(NewMessage(add ? RTM_NEWNEIGH : RTM_DELNEIGH,
                               NLM_F_REQUEST | (add ? NLM_F_CREATE | NLM_F_REPLACE : 0)));
    ndmsg header{};
    header.ndm_family = AF_BRIDGE;
    header.ndm_ifindex = portIndex;
    header.ndm_state = NUD_NOARP;
    header.ndm_flags = NTF_MASTER;
    if (nlmsg_append(message.get(), &header, sizeof(header), NLMSG_ALIGNTO) < 0)
        throw HostCtlException("out of memory");
    Put(nla_put(message.get(), NDA_LLADDR, sizeof(bytes), bytes));
    return message.release();
}

void ChangeStaticEntry(const Namespace& ns, int portIndex, const std::string& name, const std::string& mac,
                       bool add) {
    Send(ns, BuildStaticEntry(portIndex, mac, add),
         std::string("Cannot ") + (add ? "add" : "remove") + " the forwarding entry of " + mac + " on " +
             name);
}

std::optional<ForwardingEntry> ParseForwardingEntry(nl_msg* message) {
    nlmsghdr* header = nlmsg_hdr(message);
    if (header->nlmsg_type != RTM_NEWNEIGH || !nlmsg_valid_hdr(header, sizeof(ndmsg))) return std::nullopt;
    const auto* nd = static_cast<const ndmsg*>(nlmsg_data(header));
    if (nd->ndm_family != AF_BRIDGE) return std::nullopt;
    nlattr* attrs[NDA_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(ndmsg), attrs, NDA_MAX, nullptr) < 0) return std::nullopt;
    // The bridge's own entries name it (NDA_MASTER); a device's own address lists (NTF_SELF)
    // are no forwarding.
    if (!attrs[NDA_MASTER] && !(nd->ndm_flags & NTF_MASTER)) return std::nullopt;
    ForwardingEntry entry;
    entry.port = nd->ndm_ifindex;
    entry.mac = MacText(attrs[NDA_LLADDR]);
    entry.local = nd->ndm_state & NUD_PERMANENT;
    entry.isStatic = nd->ndm_state & (NUD_NOARP | NUD_PERMANENT);
    if (entry.mac.empty()) return std::nullopt;
    return entry;
}

std::vector<ForwardingEntry> ListForwardingEntries(const Namespace& ns) {
    auto replies = Exchange(ns, Dump(RTM_GETNEIGH, AF_BRIDGE, sizeof(ndmsg)),
                            "cannot list the forwarding entries of the bridges" + In(ns), true);
    std::vector<ForwardingEntry> entries;
    for (const auto& reply : replies) {
        if (auto entry = ParseForwardingEntry(reply.get())) entries.push_back(std::move(*entry));
    }
    return entries;
}

// ---------------------------------------------------------------- addresses

std::optional<std::pair<int, LinkAddress>> ParseLinkAddress(nl_msg* message) {
    nlmsghdr* header = nlmsg_hdr(message);
    if (header->nlmsg_type != RTM_NEWADDR || !nlmsg_valid_hdr(header, sizeof(ifaddrmsg))) return std::nullopt;
    const auto* info = static_cast<const ifaddrmsg*>(nlmsg_data(header));
    nlattr* attrs[IFA_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(ifaddrmsg), attrs, IFA_MAX, nullptr) < 0) return std::nullopt;
    // IPv4 names its own address IFA_LOCAL (IFA_ADDRESS is the peer's on a point-to-point link).
    nlattr* addr = attrs[IFA_LOCAL] ? attrs[IFA_LOCAL] : attrs[IFA_ADDRESS];
    const int family = info->ifa_family;
    const int length = family == AF_INET ? 4 : family == AF_INET6 ? 16 : 0;
    if (!addr || length == 0 || nla_len(addr) != length) return std::nullopt;
    char text[INET6_ADDRSTRLEN];
    if (!inet_ntop(family, nla_data(addr), text, sizeof(text))) return std::nullopt;
    LinkAddress out;
    out.family = family;
    out.address = std::string(text) + "/" + std::to_string(info->ifa_prefixlen);
    if (family == AF_INET6) {
        const auto* bytes = static_cast<const unsigned char*>(nla_data(addr));
        const bool linkLocal = bytes[0] == 0xfe && (bytes[1] & 0xc0) == 0x80;
        const bool kernelMade = !attrs[IFA_PROTO] || nla_get_u8(attrs[IFA_PROTO]) == IFAPROT_KERNEL_LL;
        out.kernelLinkLocal = linkLocal && kernelMade;
    }
    return std::make_pair(static_cast<int>(info->ifa_index), out);
}

std::vector<LinkAddress> ListLinkAddresses(const Namespace& ns, int index) {
    auto replies = Exchange(ns, Dump(RTM_GETADDR, AF_UNSPEC, sizeof(ifaddrmsg)),
                            "cannot list the addresses" + In(ns), true);
    std::vector<LinkAddress> addresses;
    for (const auto& reply : replies) {
        auto parsed = ParseLinkAddress(reply.get());
        if (parsed && parsed->first == index) addresses.push_back(std::move(parsed->second));
    }
    return addresses;
}

// ---------------------------------------------------------------- namespace IDs

std::optional<int> NamespaceId(const Namespace& from, const Namespace& of) {
    int fd = open(of.Path().c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) return std::nullopt;
    struct Close {
        int fd;
        ~Close() { close(fd); }
    } closer{fd};
    Message request(NewMessage(RTM_GETNSID, NLM_F_REQUEST));
    rtgenmsg header{};
    header.rtgen_family = AF_UNSPEC;
    if (nlmsg_append(request.get(), &header, sizeof(header), NLMSG_ALIGNTO) < 0)
        throw HostCtlException("out of memory");
    Put(nla_put_u32(request.get(), NETNSA_FD, static_cast<std::uint32_t>(fd)));
    auto replies =
        Exchange(from, std::move(request), "cannot ask for the ID of namespace " + of.Name(), false);
    for (const auto& reply : replies) {
        nlmsghdr* h = nlmsg_hdr(reply.get());
        if (h->nlmsg_type != RTM_NEWNSID) continue;
        nlattr* attrs[NETNSA_MAX + 1] = {};
        if (nlmsg_parse(h, sizeof(rtgenmsg), attrs, NETNSA_MAX, nullptr) < 0 || !attrs[NETNSA_NSID]) continue;
        int id = nla_get_s32(attrs[NETNSA_NSID]);
        if (id >= 0) return id;
    }
    return std::nullopt;
}

}  // namespace TknCtl::Linux::Kernel

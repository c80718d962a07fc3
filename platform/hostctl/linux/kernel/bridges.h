// Bridges and their ports through rtnetlink: what a bridge and each of its ports say of
// themselves, the port flags that decide what a port may receive and send, VLAN filtering,
// static forwarding entries, and the addresses a link holds.
//
// Requests are built (Build...) and replies read (Parse...) by functions of plain values, so
// that both are tested without a kernel; the functions that reach the kernel compose them:
//
//     auto links = Kernel::ListBridgeLinks(ns);                  // bridges, ports, everything
//     Kernel::ChangePortFlags(ns, port.index, {.unicastFlood = false, .locked = true});
//
// Failures are HostCtl::Lib::HostCtlException naming what was asked and the kernel's refusal.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "kernel/netlink.h"

struct nl_msg;

namespace TknCtl::Linux::Kernel {

// The bridge port states (BR_STATE_...).
enum BridgePortState : std::uint8_t {
    kPortDisabled = 0,
    kPortListening = 1,
    kPortLearning = 2,
    kPortForwarding = 3,
    kPortBlocking = 4,
};

// What a bridge says of itself (IFLA_INFO_DATA of a link of kind "bridge").
struct BridgeInfo {
    // The kernel reports the VLAN settings of its bridges only when it has VLAN filtering
    // (CONFIG_BRIDGE_VLAN_FILTERING).
    bool vlanFilteringAvailable = false;
    bool vlanFiltering = false;
    std::uint16_t defaultPvid = 0;
    bool stp = false;

    bool operator==(const BridgeInfo&) const = default;
};

// What a bridge says of one of its ports (IFLA_INFO_SLAVE_DATA of a bridge port).
struct PortInfo {
    std::uint8_t state = kPortDisabled;
    bool learning = true;      // the bridge learns the source addresses the port sends from
    bool unicastFlood = true;  // unknown unicast is flooded to the port
    bool neighSuppress = false;
    bool locked = false;     // only sources with a forwarding entry of their own pass
    bool hasLocked = false;  // the kernel knows locked ports (5.18 and later)

    bool operator==(const PortInfo&) const = default;
};

// A link as a dump of the namespace's links reads it, with what bridges and bridge ports add.
struct BridgeLink {
    int index = 0;
    std::string name;
    std::string kind;  // "bridge", "veth", "tun", ...; empty for a device of no kind
    std::string mac;   // lower case; empty when the link has none
    unsigned mtu = 0;
    bool up = false;
    int master = 0;                      // IFLA_MASTER: the bridge (or bond, ...) it is a port of
    std::string masterKind;              // IFLA_INFO_SLAVE_KIND: "bridge" for a bridge port
    int peer = 0;                        // IFLA_LINK: a veth's peer, in peerNamespaceId when set
    std::optional<int> peerNamespaceId;  // IFLA_LINK_NETNSID: the peer lies in another namespace
    std::optional<BridgeInfo> bridge;    // set for a bridge
    std::optional<PortInfo> port;        // set for a bridge port

    bool operator==(const BridgeLink&) const = default;
};

// Every link of the namespace, in index order.
std::vector<BridgeLink> ListBridgeLinks(const Namespace& ns);
// A reply message (RTM_NEWLINK) reads into a plain value; nothing when it is no link message.
std::optional<BridgeLink> ParseBridgeLink(nl_msg* message);

// A new bridge of that name (RTM_NEWLINK, create exclusively), down, with its MTU; index asks
// for an interface index (a bridge made again), 0 leaves it to the kernel.
nl_msg* BuildBridgeAdd(const std::string& name, unsigned mtu, int index = 0);
void AddBridge(const Namespace& ns, const std::string& name, unsigned mtu, int index = 0);
// Deletes a link (RTM_DELLINK); a bridge releases its ports as it goes.
nl_msg* BuildLinkDelete(int index);
void DeleteLink(const Namespace& ns, int index, const std::string& name);

// VLAN filtering of a bridge (IFLA_BR_VLAN_FILTERING).
nl_msg* BuildBridgeVlanFiltering(int bridgeIndex, bool on);
void SetBridgeVlanFiltering(const Namespace& ns, int bridgeIndex, const std::string& name, bool on);

// A change of a bridge port's flags: what is set is changed (RTM_SETLINK, AF_BRIDGE,
// IFLA_PROTINFO).
struct PortFlagsChange {
    std::optional<bool> learning;
    std::optional<bool> unicastFlood;
    std::optional<bool> neighSuppress;
    std::optional<bool> locked;
    bool Empty() const { return !learning && !unicastFlood && !neighSuppress && !locked; }
};
nl_msg* BuildPortFlags(int portIndex, const PortFlagsChange& change);
void ChangePortFlags(const Namespace& ns, int portIndex, const std::string& name,
                     const PortFlagsChange& change);

// VLANs of a bridge port (IFLA_BRIDGE_VLAN_INFO): a VLAN or a range of them.
struct PortVlan {
    std::uint16_t vid = 0;
    std::uint16_t lastVid = 0;  // a range vid..lastVid; 0 (or vid): the one VLAN
    bool pvid = false;          // untagged frames the port receives join this VLAN
    bool untagged = false;      // the port sends this VLAN's frames untagged

    bool operator==(const PortVlan&) const = default;
};
// Adds (RTM_SETLINK) or deletes (RTM_DELLINK) VLANs of a port, family AF_BRIDGE, nested in
// IFLA_AF_SPEC with BRIDGE_FLAGS_MASTER.
nl_msg* BuildPortVlans(int portIndex, const std::vector<PortVlan>& vlans, bool add);
void ChangePortVlans(const Namespace& ns, int portIndex, const std::string& name,
                     const std::vector<PortVlan>& vlans, bool add);
// The request that dumps the VLANs of every bridge port (AF_BRIDGE links, RTEXT_FILTER_BRVLAN).
nl_msg* BuildPortVlanDump();
// The VLANs of a port in a reply to that dump (ranges joined as the kernel sends them); nothing
// when the message is no such reply.
std::optional<std::pair<int, std::vector<PortVlan>>> ParsePortVlans(nl_msg* message);
// The VLANs of the ports of the namespace's bridges, by port index.
std::vector<std::pair<int, std::vector<PortVlan>>> ListPortVlans(const Namespace& ns);

// A static forwarding entry of a bridge port: frames for mac go out of the port, and a locked
// port lets frames from mac in (bridge fdb add MAC dev PORT master static).
nl_msg* BuildStaticEntry(int portIndex, const std::string& mac, bool add);
void ChangeStaticEntry(const Namespace& ns, int portIndex, const std::string& name, const std::string& mac,
                       bool add);
// The MAC addresses of the static entries of the bridge ports (by port index).
struct ForwardingEntry {
    int port = 0;
    std::string mac;
    bool isStatic = false;  // added by a user (NUD_NOARP or NUD_PERMANENT), not learned
    bool local = false;     // the port's own address (NUD_PERMANENT)

    bool operator==(const ForwardingEntry&) const = default;
};
std::vector<ForwardingEntry> ListForwardingEntries(const Namespace& ns);
std::optional<ForwardingEntry> ParseForwardingEntry(nl_msg* message);

// An address of a link, as far as a bridge port cares.
struct LinkAddress {
    int family = 0;                // AF_INET, AF_INET6
    std::string address;           // "192.0.2.1/24", "fe80::1/64"
    bool kernelLinkLocal = false;  // an IPv6 link-local address the kernel made itself

    bool operator==(const LinkAddress&) const = default;
};
// The addresses of one link. The kernel says which link-local addresses it made itself
// (IFA_PROTO, 5.18 and later); where it does not, every IPv6 link-local address counts as its own.
std::vector<LinkAddress> ListLinkAddresses(const Namespace& ns, int index);
std::optional<std::pair<int, LinkAddress>> ParseLinkAddress(nl_msg* message);

// The ID (NETNSA_NSID) under which namespace `from` knows the namespace `of`; nothing when it
// has given it none.
std::optional<int> NamespaceId(const Namespace& from, const Namespace& of);

}  // namespace TknCtl::Linux::Kernel

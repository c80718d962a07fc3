// What a checkpoint of the Linux host holds: everything a command of this host may change, read
// from the kernel and the files at one moment, as plain values (names, never interface indices:
// a device made again gets a new index). core/restore.h brings the host back to a snapshot;
// core/checkpoint.h keeps one pending beside the host's document.
//
// Per netstack (the program's namespace and each named one of /run/netns):
//   links          name, kind, MAC address, MTU, administrative state, the bridge it is a port
//                  of, a veth's other end (its netstack and name), a bridge port's flags, VLANs
//                  and static forwarding entries, the token bucket at its root, its IPv6
//                  settings (accept_ra, disable_ipv6)
//   addresses      those made by hand (not the kernel's own link-local, loopback or
//                  autoconfigured ones), in the kernel's order
//   routes         every table but the kernel's local one; not those learned from router
//                  advertisements or redirects
//   neighbours     permanent entries
//   sysctls        those the host writes: somaxconn, tcp_congestion_control, disable_ipv6
//                  (all and default)
//   files          its resolv.conf, and whether /etc/netns/NAME is there (and /etc/netns)
// Once for the host: the firewall's nftables table (inet hadro), the xfrm policies, the xfrm
// states by their identity (never their keys: the kernel does not give them back), and the
// host's own document.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "kernel/bridges.h"
#include "kernel/qdiscs.h"
#include "kernel/xfrm.h"

namespace TknCtl::Linux {

class Context;

// A bridge port's flags (kernel/bridges.h: PortInfo without its run-time state).
struct SavedPortFlags {
    bool learning = true;
    bool unicastFlood = true;
    bool neighSuppress = false;
    std::optional<bool> locked;  // where the kernel knows locked ports

    bool operator==(const SavedPortFlags&) const = default;
};

struct SavedLink {
    int index = 0;  // the interface index, asked for again when the link is made again
    std::string name;
    std::string kind;  // "veth", "bridge", ...; empty for a device of no kind
    std::string mac;   // lower case; empty when the device has none
    unsigned mtu = 0;
    bool up = false;
    std::string master;  // the bridge (of the same netstack) it is a port of; empty: none
    // A veth's other end; peerName is empty when it lies in no netstack of the host.
    std::string peerNetstack;
    std::string peerName;
    unsigned rxQueues = 0;  // as a veth end is made with them
    unsigned gsoMaxSize = 0;
    std::optional<bool> vlanFiltering;  // a bridge, where the kernel has VLAN filtering
    std::optional<SavedPortFlags> port;
    std::vector<Kernel::PortVlan> vlans;
    std::vector<std::string> staticEntries;     // MACs of the port's static forwarding entries, sorted
    std::optional<Kernel::TokenBucket> bucket;  // a token bucket at its root
    std::optional<std::string> acceptRa;        // net.ipv6.conf.NAME.*; nothing where it has none
    std::optional<std::string> disableIpv6;

    bool operator==(const SavedLink&) const = default;
};

struct SavedAddress {
    int family = 0;  // AF_INET, AF_INET6
    std::string device;
    std::string address;
    unsigned prefixLength = 0;
    std::string peer;
    std::string broadcast;
    std::string label;
    std::uint32_t flags = 0;  // what was asked for (kSavedAddressFlags): no run-time state
    unsigned scope = 0;
    bool permanent = true;  // the lifetimes below only matter for one that expires
    std::uint32_t validLifetime = 0xffffffffu;
    std::uint32_t preferredLifetime = 0xffffffffu;

    // The same address as far as a restore is concerned (lifetimes that run down are not).
    bool Same(const SavedAddress& other) const;
    bool operator==(const SavedAddress&) const = default;
};

// The flags of an address that say how it was asked for: nodad, homeaddress, mngtmpaddr,
// noprefixroute, autojoin.
constexpr std::uint32_t kSavedAddressFlags = 0x02 | 0x10 | 0x100 | 0x200 | 0x400;

struct SavedNexthop {
    std::string gateway;
    std::string device;
    bool operator==(const SavedNexthop&) const = default;
};

struct SavedRoute {
    int family = 0;
    unsigned table = 254;
    std::string destination;
    unsigned prefixLength = 0;
    unsigned protocol = 0;
    unsigned type = 1;
    unsigned scope = 0;
    std::uint32_t metric = 0;
    std::string preferredSource;
    std::vector<SavedNexthop> nexthops;

    bool operator==(const SavedRoute&) const = default;
};

struct SavedNeighbour {
    int family = 0;
    std::string device;
    std::string address;
    std::string linkLayer;
    std::uint8_t flags = 0;  // NTF_ROUTER

    bool operator==(const SavedNeighbour&) const = default;
};

struct SavedNetstack {
    std::string name;  // defaultTcpipStack, or the named namespace
    std::vector<SavedLink> links;
    std::vector<SavedAddress> addresses;
    std::vector<SavedRoute> routes;
    std::vector<SavedNeighbour> neighbours;
    std::map<std::string, std::string> sysctls;  // under net/: "core/somaxconn", ...
    bool hasFiles = false;                       // /etc/netns/NAME (named netstacks)
    std::optional<std::string> resolvConf;       // its resolv.conf; nothing: there is none
    bool resolvManaged = false;                  // a resolver daemon's file: never written

    bool operator==(const SavedNetstack&) const = default;
    const SavedLink* FindLink(const std::string& name) const;
};

// An xfrm policy (kernel/xfrm.h: XfrmPolicy without the index the kernel gives it).
struct SavedPolicy {
    Kernel::XfrmSelector selector;
    int direction = Kernel::kXfrmOut;
    int action = Kernel::kXfrmAllow;
    std::uint32_t priority = 0;
    bool mainType = true;
    std::vector<Kernel::XfrmTemplate> templates;

    bool operator==(const SavedPolicy&) const = default;
};

// An xfrm state by its identity.
struct SavedState {
    int family = 0;
    std::string source;
    std::string destination;
    std::uint32_t spi = 0;
    int protocol = 0;
    bool operator==(const SavedState&) const = default;
};

struct Snapshot {
    std::int64_t taken = 0;                // seconds since the epoch
    std::vector<SavedNetstack> netstacks;  // the default netstack first
    bool netstackFiles = false;            // /etc/netns, where netstacks keep their files
    bool firewallKnown = true;             // false: nftables could not be read (left alone)
    std::optional<std::string> firewall;   // the table's objects (libnftables JSON); nothing: no table
    std::vector<SavedPolicy> policies;
    std::vector<SavedState> states;
    std::optional<std::string> document;  // the host's document; nothing: there is none

    bool operator==(const Snapshot&) const = default;
    const SavedNetstack* FindNetstack(const std::string& name) const;
};

// The settings of a netstack a snapshot keeps.
extern const char* const kSavedSysctls[4];

// The snapshot as JSON text, and back. Reading throws std::invalid_argument saying what is
// wrong (a missing member, one of the wrong type, an unknown version).
std::string SnapshotToJson(const Snapshot& snapshot);
Snapshot SnapshotFromJson(std::string_view text);

// The table of a libnftables listing ("list table inet hadro") as a snapshot keeps it: its
// objects without their handles (which the kernel gives anew) and without the metainfo.
std::string FirewallObjects(const std::string& listing);

// Reads the host: every netstack, the firewall, xfrm and the document. Throws
// HostCtl::Lib::HostCtlException when the kernel cannot be read.
Snapshot TakeSnapshot(Context& context);

}  // namespace TknCtl::Linux

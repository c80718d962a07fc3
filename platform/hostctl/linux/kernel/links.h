// Links (network devices) through rtnetlink: what the kernel says of each, and changes of the
// attributes every device has. Replies are read into plain values (ParseLink) and requests
// built from them (BuildLinkChange), so that both are tested without a kernel.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "kernel/netlink.h"

struct nl_msg;
struct nlmsghdr;
struct rtnl_link;

namespace TknCtl::Linux::Kernel {

// The 64-bit counters of a device (IFLA_STATS64).
struct LinkStats {
    std::uint64_t rxPackets = 0, txPackets = 0, rxBytes = 0, txBytes = 0;
    std::uint64_t rxErrors = 0, txErrors = 0, rxDropped = 0, txDropped = 0;
    std::uint64_t multicast = 0, collisions = 0;
    std::uint64_t rxLengthErrors = 0, rxOverErrors = 0, rxCrcErrors = 0, rxFrameErrors = 0, rxFifoErrors = 0,
                  rxMissedErrors = 0;
    std::uint64_t txAbortedErrors = 0, txCarrierErrors = 0, txFifoErrors = 0, txHeartbeatErrors = 0,
                  txWindowErrors = 0;
};

struct Link {
    int index = 0;
    std::string name;
    std::string kind;       // "veth", "bridge", "macvlan", ...; empty for a device of no kind
    std::string mac;        // "02:00:00:00:00:01", lower case; empty when the device has none
    std::string broadcast;  // link-layer broadcast address
    unsigned mtu = 0;
    unsigned flags = 0;     // IFF_... of the device
    bool up = false;        // administratively up (IFF_UP)
    bool lowerUp = false;   // carrier (IFF_LOWER_UP)
    std::string operState;  // "up", "down", "lowerlayerdown", "unknown", ...
    int master = 0;         // index of the bridge (or other master) it is a port of; 0: none
    int peer = 0;           // IFLA_LINK: a veth's peer, a macvlan's lower device; 0: none
    bool loopback = false;
    std::uint32_t txQueueLength = 0;
    std::uint32_t numTxQueues = 0, numRxQueues = 0;
    std::uint32_t gsoMaxSize = 0;  // the largest packet the stack hands the device to segment
    LinkStats stats;

    // The device's IPv6 settings (the sysctls of net/ipv6/conf/DEVICE, as rtnetlink reports
    // them); nothing when the device has no IPv6 state. Filled by ListLinks and ParseLink.
    struct Ipv6Settings {
        bool disabled = false;  // disable_ipv6
        int acceptRa = 0;       // accept_ra: 0 never, 1 unless forwarding, 2 even when forwarding
        bool forwarding = false;
        bool AcceptsRouterAdvertisements() const { return acceptRa == 2 || (acceptRa == 1 && !forwarding); }
    };
    std::optional<Ipv6Settings> ipv6;
};

// Every link of the namespace, in index order. Without stats the kernel leaves out the
// counters of every device (its own and IPv6's): a listing of many devices costs much less.
std::vector<Link> ListLinks(const Namespace& ns, bool withStats = true);
// The link of that name, or nothing.
std::optional<Link> FindLink(const Namespace& ns, const std::string& name);

// A change of a link's common attributes: what is set is changed.
struct LinkChange {
    std::optional<bool> up;
    std::optional<unsigned> mtu;
    std::optional<std::string> mac;
    std::optional<int> master;  // index of a bridge; 0 takes the link out of its bridge
    bool Empty() const { return !up && !mtu && !mac && !master; }
};

// Changes the link of that name; throws HostCtlException naming the link, the change and the
// kernel's refusal.
void ChangeLink(const Namespace& ns, const std::string& name, const LinkChange& change);

// A link as a libnl object reads into a plain value (without its IPv6 settings, which libnl
// does not hand out).
Link LinkFromObject(rtnl_link* object);
// A reply message (RTM_NEWLINK) reads into a plain value; nothing when it is no link message.
std::optional<Link> ParseLink(nl_msg* message);
std::optional<Link> ParseLink(const nlmsghdr* message);
// The request (RTM_NEWLINK on the link's index) that makes a change; the caller frees it with
// nlmsg_free. Throws HostCtlException for a change libnl cannot express (a malformed MAC).
nl_msg* BuildLinkChange(int index, const LinkChange& change);

}  // namespace TknCtl::Linux::Kernel

// Veth pairs through rtnetlink. One request made in the namespace of one end (the "end")
// creates both; the other end (the "peer") is created directly in the namespace the request
// names (IFLA_NET_NS_FD in the peer's attributes), so that its name is checked there and it
// never appears where it does not belong:
//
//     RTM_NEWLINK (create, exclusive)  ifinfomsg  IFLA_IFNAME end  IFLA_ADDRESS  IFLA_MTU
//       IFLA_LINKINFO
//         IFLA_INFO_KIND "veth"
//         IFLA_INFO_DATA
//           VETH_INFO_PEER  ifinfomsg  IFLA_IFNAME peer  IFLA_ADDRESS  IFLA_MTU
//                           IFLA_NUM_RX_QUEUES  IFLA_GSO_MAX_SIZE  IFLA_NET_NS_FD
//
// Both ends are made down: the kernel cannot bring a peer up while it makes it (its veth is not
// joined to it yet: ENOTCONN). Deleting either end deletes both (kernel/bridges.h: DeleteLink).
#pragma once

#include <string>

#include "kernel/netlink.h"

struct nl_msg;

namespace TknCtl::Linux::Kernel {

// One end of a pair: what is left unset is the kernel's choice.
struct VethEnd {
    std::string name;
    std::string mac;          // "02:00:00:00:00:01"; empty: a random address of the kernel's
    unsigned mtu = 0;         // 0: the kernel's (1500)
    unsigned rxQueues = 0;    // 0: the kernel's (one per possible CPU)
    unsigned gsoMaxSize = 0;  // 0: the kernel's
    int index = 0;            // the interface index asked for (one made again); 0: the kernel's

    bool operator==(const VethEnd&) const = default;
};

struct VethPair {
    VethEnd end;   // made in the namespace the request is sent in
    VethEnd peer;  // made in the namespace of peerNamespaceFd

    bool operator==(const VethPair&) const = default;
};

// The request that makes the pair; peerNamespaceFd is an open file of the peer's namespace
// (/run/netns/NAME), or -1 for the namespace of the end. The caller frees it with nlmsg_free.
// Throws HostCtlException for a malformed MAC address.
nl_msg* BuildVethAdd(const VethPair& pair, int peerNamespaceFd);

// Makes the pair: the end in ns, the peer in peerNs. Throws HostCtlException("Cannot create
// veth pair END/PEER: " + the kernel's reason) when the kernel refuses (a name in use, ...);
// nothing is made then.
void AddVeth(const Namespace& ns, const VethPair& pair, const Namespace& peerNs);

}  // namespace TknCtl::Linux::Kernel

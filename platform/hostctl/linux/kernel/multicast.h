// Multicast group memberships of the devices: the kernel's tables /proc/net/igmp (IPv4) and
// /proc/net/igmp6 (IPv6) of a namespace, read into plain values (ParseIgmp, ParseIgmp6).
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "kernel/netlink.h"

namespace TknCtl::Linux::Kernel {

struct Membership {
    int index = 0;  // the device's
    std::string device;
    std::string group;        // the group's address as text
    std::uint32_t users = 0;  // how many sockets and kernel users joined it
};

// The memberships of /proc/net/igmp: a line per device ("Idx Device : Count Querier"), then a
// line per group (its address in hexadecimal as the kernel holds it, its users, ...).
std::vector<Membership> ParseIgmp(const std::string& text);
// The memberships of /proc/net/igmp6: a line per membership (index, device, address in 32
// hexadecimal digits, users, flags, timer).
std::vector<Membership> ParseIgmp6(const std::string& text);

// The memberships of a namespace: IPv4 then IPv6, each in the kernel's order. Throws
// HostCtlException when the namespace cannot be entered.
std::vector<Membership> ListMemberships(const Namespace& ns);

// The Ethernet address a group is sent to: 01:00:5e and the low 23 bits of an IPv4 group,
// 33:33 and the low 32 bits of an IPv6 group; empty for text that is no multicast address.
std::string EthernetGroupAddress(const std::string& group);

}  // namespace TknCtl::Linux::Kernel

// Addresses of the network devices through rtnetlink: what the kernel says of each (ParseAddress)
// and the requests that add and delete them (BuildAddressRequest), as plain values.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "kernel/netlink.h"

struct nl_msg;
struct nlmsghdr;

namespace TknCtl::Linux::Kernel {

// The lifetime of an address that does not expire.
constexpr std::uint32_t kForever = 0xffffffffu;

struct Address {
    int family = 0;  // AF_INET or AF_INET6
    int index = 0;   // the device's
    std::string address;
    unsigned prefixLength = 0;
    std::string peer;                        // the other end of a point-to-point link (IPv4); empty otherwise
    std::string broadcast;                   // IPv4; empty when the address has none
    std::string label;                       // IPv4
    std::uint32_t flags = 0;                 // IFA_F_...
    unsigned scope = 0;                      // RT_SCOPE_...
    unsigned protocol = 0;                   // IFAPROT_...: who made it; 0 when unknown or given by a program
    std::uint32_t validLifetime = kForever;  // seconds left
    std::uint32_t preferredLifetime = kForever;
};

// The addresses of a namespace (family AF_INET, AF_INET6, or AF_UNSPEC for both), in the
// kernel's order (by device, then as the device holds them: primary before secondary).
std::vector<Address> ListAddresses(const Namespace& ns, int family);

// A reply message (RTM_NEWADDR) read into a plain value; nothing when it is no address message.
std::optional<Address> ParseAddress(const nlmsghdr* message);

// The request that adds (RTM_NEWADDR: a new address, refused when it exists) or deletes
// (RTM_DELADDR) an address; the caller frees it with nlmsg_free (Request does). A new IPv4
// address without a broadcast gets the directed broadcast of its subnet (none for /31 and
// /32). Throws HostCtlException for an address that is not of its family.
nl_msg* BuildAddressRequest(int type, const Address& address);

// Adds or deletes the address of the device named; a refusal names the address and the device.
void AddAddress(const Namespace& ns, const Address& address, const std::string& device);
void DeleteAddress(const Namespace& ns, const Address& address, const std::string& device);

}  // namespace TknCtl::Linux::Kernel

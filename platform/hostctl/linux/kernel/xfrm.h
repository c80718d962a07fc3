// IPsec states (security associations) and policies of the kernel's xfrm framework, through
// NETLINK_XFRM and libnl-xfrm: what the kernel holds, read into plain values (SaFromObject,
// ParseSa, PolicyFromObject, ParsePolicy), and requests built from plain values (BuildSaAdd,
// BuildPolicyAdd, ...), so that both are tested without a kernel.
//
// Keys go into a request and nowhere else: a state read back never carries them.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "kernel/netlink.h"

struct nl_msg;
struct xfrmnl_sa;
struct xfrmnl_sp;

namespace TknCtl::Linux::Kernel {

// Address families and protocols as the kernel numbers them (AF_INET6, IPPROTO_ESP, ...).
constexpr int kXfrmInet = 2;
constexpr int kXfrmInet6 = 10;
constexpr int kXfrmEsp = 50;
constexpr int kXfrmAh = 51;
// Modes (XFRM_MODE_...).
constexpr int kXfrmTransport = 0;
constexpr int kXfrmTunnel = 1;
// Policy directions and actions (XFRM_POLICY_...).
constexpr int kXfrmIn = 0;
constexpr int kXfrmOut = 1;
constexpr int kXfrmForward = 2;
constexpr int kXfrmAllow = 0;
constexpr int kXfrmBlock = 1;

// An algorithm of a state: its name in the kernel's crypto API ("cbc(aes)", "hmac(sha1)"),
// the key's length in bits and, for integrity, the length of the truncated ICV in bits.
struct XfrmAlgorithm {
    std::string name;
    unsigned keyBits = 0;
    unsigned truncationBits = 0;
    std::string key;  // raw bytes; only in requests
    bool operator==(const XfrmAlgorithm& other) const {
        return name == other.name && keyBits == other.keyBits && truncationBits == other.truncationBits;
    }
};

// A state (security association), identified by destination, SPI and protocol.
struct XfrmState {
    int family = kXfrmInet6;
    std::string source;  // address text; "::" (or "0.0.0.0") for any
    std::string destination;
    std::uint32_t spi = 0;
    int protocol = kXfrmEsp;
    int mode = kXfrmTransport;
    std::uint32_t reqid = 0;
    std::optional<XfrmAlgorithm> encryption;
    std::optional<XfrmAlgorithm> integrity;
    std::uint64_t lifetimeSeconds = 0;  // hard expiry after it was added; 0 never
};

// What a policy applies to.
struct XfrmSelector {
    int family = kXfrmInet6;
    std::string source = "::";
    unsigned sourcePrefix = 0;
    std::string destination = "::";
    unsigned destinationPrefix = 0;
    std::uint16_t sourcePort = 0;  // 0 any
    std::uint16_t destinationPort = 0;
    int protocol = 0;  // 0 any; IPPROTO_TCP, IPPROTO_UDP, IPPROTO_ICMPV6, ...
    bool operator==(const XfrmSelector& other) const = default;
};

// A template of a policy: the state that must protect the traffic. A zero SPI and "::"
// addresses leave the choice to the kernel (or a key manager).
struct XfrmTemplate {
    int family = kXfrmInet6;
    std::string source = "::";
    std::string destination = "::";
    std::uint32_t spi = 0;
    int protocol = kXfrmEsp;
    int mode = kXfrmTransport;
    bool operator==(const XfrmTemplate& other) const = default;
};

struct XfrmPolicy {
    XfrmSelector selector;
    int direction = kXfrmOut;
    int action = kXfrmAllow;
    std::vector<XfrmTemplate> templates;
    std::uint32_t index = 0;  // the kernel's; 0 in a request
    std::uint32_t priority = 0;
    bool mainType = true;  // a main policy (not a sub policy)
};

// Every state and policy of the namespace, in the kernel's order. Throws HostCtlException
// (the kernel shows them only to CAP_NET_ADMIN).
std::vector<XfrmState> ListStates(const Namespace& ns);
std::vector<XfrmPolicy> ListPolicies(const Namespace& ns);

// The kernel's refusal of a request: the error number and the kernel's own words (extended
// acknowledgement), when it gave them.
struct XfrmRefusal {
    int error = 0;  // errno
    std::string message;
};

// Sends a request (and frees it); nothing when the kernel carried it out, else its refusal.
std::optional<XfrmRefusal> Send(const Namespace& ns, nl_msg* request);

// Requests (the caller frees them with nlmsg_free, or hands them to Send). Throw
// HostCtlException for values that cannot be expressed (a malformed address, a key longer
// than its algorithm allows).
nl_msg* BuildStateAdd(const XfrmState& state);
nl_msg* BuildStateDelete(const XfrmState& state);  // by destination, SPI and protocol
nl_msg* BuildPolicyAdd(const XfrmPolicy& policy);
nl_msg* BuildPolicyDelete(const XfrmPolicy& policy);  // by index and direction

// The algorithms of the IPsec commands: the kernel's algorithm for a name ("aes128-cbc" is
// cbc(aes) with a 128-bit key; "hmac-sha2-256" is hmac(sha256) truncated to 128 bits), nothing
// for another name; and back, empty for an algorithm the commands have no name for.
std::optional<XfrmAlgorithm> EncryptionByName(const std::string& name);
std::optional<XfrmAlgorithm> IntegrityByName(const std::string& name);
std::string EncryptionName(const XfrmAlgorithm& algorithm);
std::string IntegrityName(const XfrmAlgorithm& algorithm);
// A key as typed: "0x" followed by hexadecimal digits, or ASCII text; its bytes.
std::string KeyBytes(const std::string& text);

// Objects and messages (XFRM_MSG_NEWSA, XFRM_MSG_NEWPOLICY) read into plain values; nothing
// for a message of another kind.
XfrmState StateFromObject(xfrmnl_sa* object);
XfrmPolicy PolicyFromObject(xfrmnl_sp* object);
std::optional<XfrmState> ParseState(nl_msg* message);
std::optional<XfrmPolicy> ParsePolicy(nl_msg* message);

}  // namespace TknCtl::Linux::Kernel

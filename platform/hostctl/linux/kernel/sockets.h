// Internet sockets of a namespace through sock_diag (NETLINK_SOCK_DIAG): TCP, UDP and raw IP
// sockets, as `ss -tuwa` sees them. The dump request is built (BuildSocketDump) and each reply
// read (ParseSocket) by functions of plain values, so that both are tested without a kernel.
// Where the kernel has no socket diagnostics for a kind (raw_diag is often left out), its
// tables in /proc/net are read instead, as ss does (ParseProcNetSockets).
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "kernel/netlink.h"

struct nl_msg;

namespace TknCtl::Linux::Kernel {

enum class SocketKind { kTcp, kUdp, kRaw };

// The kernel's TCP states (include/net/tcp_states.h); UDP and raw sockets use
// kTcpEstablished when connected and kTcpClose otherwise.
enum KernelTcpState : int {
    kTcpEstablished = 1,
    kTcpSynSent = 2,
    kTcpSynRecv = 3,
    kTcpFinWait1 = 4,
    kTcpFinWait2 = 5,
    kTcpTimeWait = 6,
    kTcpClose = 7,
    kTcpCloseWait = 8,
    kTcpLastAck = 9,
    kTcpListen = 10,
    kTcpClosing = 11,
    kTcpNewSynRecv = 12,
};

struct InetSocket {
    int family = 0;               // AF_INET or AF_INET6
    std::string localAddress;     // "192.0.2.1", "2001:db8::1", "::ffff:192.0.2.1"
    std::uint16_t localPort = 0;  // a raw socket's is its IP protocol, as ss shows it
    std::string remoteAddress;
    std::uint16_t remotePort = 0;
    int state = 0;                   // KernelTcpState
    std::uint32_t receiveQueue = 0;  // bytes; a listener's: connections waiting to be accepted
    std::uint32_t sendQueue = 0;     // bytes; a listener's: its backlog
    std::uint32_t uid = 0;
    std::uint64_t inode = 0;        // 0 when no file holds it (a TIME_WAIT socket, a request)
    std::string congestionControl;  // TCP: the algorithm as the kernel names it ("reno"); else empty

    bool operator==(const InetSocket&) const = default;
};

// The request that dumps every socket of a kind and an address family, in every state,
// asking TCP sockets for their congestion-control algorithm. The caller frees it with
// nlmsg_free.
nl_msg* BuildSocketDump(SocketKind kind, int family);

// A reply message (SOCK_DIAG_BY_FAMILY) reads into a plain value; nothing when it is no
// socket of an Internet family, or is cut short.
std::optional<InetSocket> ParseSocket(nl_msg* message);

// The sockets of a /proc/net table ("tcp", "udp6", "raw", ...) of the given family, in its
// order; lines that are no socket are left out. The table has no congestion-control
// algorithm.
std::vector<InetSocket> ParseProcNetSockets(std::string_view text, int family);

// Every socket of the kind in the namespace, IPv4 first, then IPv6. Throws HostCtlException
// when the kernel cannot report them.
std::vector<InetSocket> ListSockets(const Namespace& ns, SocketKind kind);

}  // namespace TknCtl::Linux::Kernel

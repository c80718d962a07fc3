// The thin layer under every kernel object kind: network namespaces and the netlink sockets
// opened inside them.
//
// A netstack of the host is a network namespace: the one the program runs in, or a named one
// of /run/netns (the convention of `ip netns`). A socket keeps the namespace it was made in,
// so each namespace gets its own sockets, made once per process:
//
//     const auto& ns = Kernel::Namespace::Named("glidex");
//     nl_sock* sock = Kernel::RouteSocket(ns);             // rtnetlink inside "glidex"
//     ns.Run([&] { ReadSysctl("net/ipv4/tcp_congestion_control"); });   // a file of the namespace
//
// Failures are HostCtl::Lib::HostCtlException with a message that says what was asked and why
// the kernel refused.
#pragma once

#include <functional>
#include <string>

struct nl_sock;

namespace TknCtl::Linux::Kernel {

// Where named namespaces are bound (the `ip netns` convention).
constexpr const char* kNamedNamespaces = "/run/netns";

class Namespace {
public:
    // The namespace the program runs in.
    static Namespace Own() { return Namespace(std::string()); }
    // A named namespace of /run/netns.
    static Namespace Named(std::string name) { return Namespace(std::move(name)); }

    bool IsOwn() const { return name_.empty(); }
    // The name; empty for the program's own namespace.
    const std::string& Name() const { return name_; }
    // The file that holds it: /proc/self/ns/net or /run/netns/NAME.
    std::string Path() const;

    // Runs fn with the calling thread inside the namespace and brings it back to the
    // program's own namespace afterwards, also when fn throws. Throws HostCtlException when the
    // namespace cannot be entered (it is gone, or entering it needs privileges the program
    // lacks: CAP_SYS_ADMIN).
    void Run(const std::function<void()>& fn) const;

    bool operator==(const Namespace& other) const { return name_ == other.name_; }

private:
    explicit Namespace(std::string name) : name_(std::move(name)) {}
    std::string name_;
};

// The netlink socket of a protocol (NETLINK_ROUTE, NETLINK_GENERIC, NETLINK_XFRM,
// NETLINK_SOCK_DIAG) inside a namespace, connected, made on first use and kept for the life of
// the process. Throws HostCtlException when it cannot be made.
nl_sock* Socket(int protocol, const Namespace& ns);
inline nl_sock* RouteSocket(const Namespace& ns) {
    return Socket(0 /* NETLINK_ROUTE */, ns);
}
// Closes every socket made for a namespace (before the namespace is deleted).
void ForgetSockets(const Namespace& ns);

// The text of a libnl error code (negative NLE_... values, as libnl's calls return them).
std::string ErrorText(int nlError);

// Throws HostCtlException(what + ": " + ErrorText(nlError)) when nlError is negative;
// returns it otherwise.
int Check(int nlError, const std::string& what);

}  // namespace TknCtl::Linux::Kernel

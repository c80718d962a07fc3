// Netstack instances of a real host, its global IP settings and its connections.
//
// The operations (NetworkInfoImpl, NetstackInstanceImpl, ResourceInfoImpl) keep the rules both
// hosts share: how keys, names, limits and algorithms are checked, that the default netstack
// is neither disabled nor removed, that a dedicated netstack is known before it is made. An
// area answers for what only the host knows: which netstacks it has, their settings, and
// whether a change can be carried out.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "hostctl/network/ip.h"

namespace TknCtl::Backend {

// What identifies a netstack of the host; a read that needs no privilege.
struct NetstackEntry {
    std::string key;
    std::string name;      // display name
    bool enabled = false;  // it exists in the kernel (state NETSTACK_STATE_ENABLED)
};

// The settings of a netstack: configured, and in force (0 and false while it is disabled).
struct NetstackSettings {
    std::uint32_t maxConnections = 0;
    std::uint32_t currentMaxConnections = 0;
    std::string congestionControl;  // the host's name of the algorithm ("newreno", "cubic", ...)
    bool ipv6Enabled = false;
    bool currentIpv6Enabled = false;
};

// Sockets of the host by class, as the connection list names them.
enum class ConnectionClass { kTcp, kUdp, kIp };

class Netstacks {
public:
    virtual ~Netstacks();

    // Every netstack, the default first.
    virtual std::vector<NetstackEntry> List() = 0;
    // The netstack of that key, or nothing.
    virtual std::optional<NetstackEntry> Find(const std::string& key) = 0;
    // Its settings; throws HostCtlException for a netstack the host does not have, or whose
    // settings the program may not read.
    virtual NetstackSettings ReadSettings(const std::string& key) = 0;

    // A new netstack (the operation has checked its key, display name and settings, and that
    // the host has no netstack of that key): made in the kernel, or kept in the host's
    // configuration only when disabled. Throws HostCtlException when the host cannot make it.
    virtual void Add(const std::string& key, const std::string& name, const NetstackSettings& settings,
                     bool disabled) = 0;
    // Removes a netstack other than the default (the operation refuses that one). Throws
    // HostCtlException when it cannot go (interfaces that would be lost with it, ...).
    virtual void Remove(const std::string& key, bool force) = 0;

    // Changes of one netstack other than its creation; each throws HostCtlException when the
    // host cannot carry it out, saying why.
    virtual void SetName(const std::string& key, const std::string& name) = 0;
    virtual void SetMaxConnections(const std::string& key, std::uint32_t maxConnections) = 0;
    virtual void SetCongestionControl(const std::string& key, const std::string& algorithm) = 0;
    virtual void SetIpv6Enabled(const std::string& key, bool enabled) = 0;
    // Makes a netstack kept in the configuration in the kernel; nothing when it is there.
    virtual void Enable(const std::string& key) = 0;
    // Takes a netstack other than the default out of the kernel, keeping its configuration.
    virtual void Disable(const std::string& key) = 0;

    // The host's IPv6 switch ("network ip get/set").
    virtual bool IsIpv6Enabled() = 0;
    virtual void SetIpv6EnabledEverywhere(bool enabled) = 0;

    // The sockets of a class on a netstack; worldId is the owner's world, 0 when it has none
    // or none can be seen.
    virtual std::vector<HostCtl::Network::TcpIpConnection> Connections(const std::string& netstack,
                                                                       ConnectionClass kind) = 0;
    // The name of a world (an owner of connections); empty for world 0. Throws
    // HostCtlException for a world the host does not have.
    virtual std::string WorldName(std::uint32_t worldId) = 0;
};

}  // namespace TknCtl::Backend

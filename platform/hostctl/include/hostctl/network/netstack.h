// Netstack instances: the host's separate Tarkon TCP/IP stacks.
//
// A netstack is known by its key ("defaultTcpipStack", "glidex", ...). It exists either in the
// configuration only (disabled, state 0) or also in the kernel (enabled, state
// NETSTACK_STATE_ENABLED, 4660). The connection limit and the IPv6 switch are configured
// values: the kernel takes them when it creates the netstack, so GetCurrentMaxConnections()
// and GetCurrentIpv6Enabled() report what is in force since the last Enable() of a disabled
// netstack (0 and false while it is disabled). The display name and the congestion-control
// algorithm take effect at once (the algorithm for new connections).
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "hostctl/lib/object.h"

namespace HostCtl::Network {

class NetstackInstance {
public:
    // Bounds of a connection limit.
    static constexpr std::int64_t MIN_MAX_CONNECTIONS = 1;
    static constexpr std::int64_t MAX_MAX_CONNECTIONS = 65535;
    // Longest key and display name.
    static constexpr std::size_t MAX_KEY_LENGTH = 32;
    static constexpr std::size_t MAX_NAME_LENGTH = 64;

    virtual ~NetstackInstance();

    // The setters' second argument asks for the value to be kept in the host configuration
    // (the netstack is re-created from it); this host keeps one configuration, so both
    // values store the setting. Every operation throws HostCtl::Lib::HostCtlException when
    // the value is refused or the netstack no longer exists.
    virtual std::string GetKey() const = 0;
    virtual std::string GetName() const = 0;
    // 1 to MAX_NAME_LENGTH printable characters.
    virtual void SetName(std::string name, bool persist) = 0;
    virtual std::uint32_t GetMaxConnections() const = 0;
    // MIN_MAX_CONNECTIONS to MAX_MAX_CONNECTIONS; in force from the next creation.
    virtual void SetMaxConnections(const std::int64_t& maxConnections, bool persist) = 0;
    virtual std::string GetCongestionControlAlgorithm() const = 0;
    // One of NetstackInstanceImpl::GetCongestionControlAlgorithmList().
    virtual void SetCongestionControlAlgorithm(std::string algorithm, bool persist) = 0;
    virtual bool GetCurrentIpv6Enabled() const = 0;
    // In force from the next creation.
    virtual void SetIpv6Enabled(bool enabled, bool persist) = 0;
    virtual bool GetIpv6Enabled() const = 0;
    virtual std::uint32_t GetState() const = 0;
    virtual std::uint32_t GetCurrentMaxConnections() const = 0;
    // Creates the netstack in the kernel with its configured values; nothing happens when it
    // is enabled already.
    virtual void Enable() = 0;
    // Removes the netstack from the kernel and keeps its configuration; its neighbour and
    // connection tables go with it. Refused for "defaultTcpipStack" and for a netstack that
    // Tarkon interfaces use.
    virtual void Disable() = 0;

protected:
    NetstackInstance() = default;
    NetstackInstance(const NetstackInstance&) = default;
    NetstackInstance& operator=(const NetstackInstance&) = default;
};

}  // namespace HostCtl::Network

namespace TknCtl::Network {

class NetworkInfoImpl;

class NetstackInstanceImpl : public HostCtl::Network::NetstackInstance, public TknCtl::Lib::TknCtlObject {
public:
    // A netstack to be created with NetworkInfoImpl::AddNetstackInstance: its key, connection
    // limit, congestion-control algorithm, IPv6 switch and kind (2: a TCP/IP stack, the only
    // kind this host creates). Until it is added, the object holds these values itself (the
    // display name is the key) and its setters change them; Enable and Disable are refused.
    NetstackInstanceImpl(const std::string& key, unsigned int maxConnections, std::string algorithm,
                         bool ipv6Enabled, unsigned int kind);
    ~NetstackInstanceImpl() override;

    // The names a congestion-control algorithm may take, in the host's order.
    static std::vector<std::string> GetCongestionControlAlgorithmList();
    // The kind of netstack this host creates.
    static constexpr unsigned int KIND_TCPIP = 2;

    std::string GetKey() const override;
    std::string GetName() const override;
    void SetName(std::string name, bool persist) override;
    std::uint32_t GetMaxConnections() const override;
    void SetMaxConnections(const std::int64_t& maxConnections, bool persist) override;
    std::string GetCongestionControlAlgorithm() const override;
    void SetCongestionControlAlgorithm(std::string algorithm, bool persist) override;
    bool GetCurrentIpv6Enabled() const override;
    void SetIpv6Enabled(bool enabled, bool persist) override;
    bool GetIpv6Enabled() const override;
    std::uint32_t GetState() const override;
    std::uint32_t GetCurrentMaxConnections() const override;
    void Enable() override;
    void Disable() override;

private:
    friend class NetworkInfoImpl;
    struct Pending {
        std::string name;
        std::int64_t maxConnections;
        std::string algorithm;
        bool ipv6Enabled;
        unsigned int kind;
    };

    // An existing netstack (handed out by NetworkInfoImpl).
    explicit NetstackInstanceImpl(std::string key);

    std::string key_;
    std::optional<Pending> pending_;  // set until the netstack is added
};

}  // namespace TknCtl::Network

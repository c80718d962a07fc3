// The host firewall: the system information object that reads and changes it, the
// firewall's kernel module, its rulesets, their port rules and allowed addresses.
//
// The firewall lives in the kernel module "hadrofw". While the module is not loaded the
// firewall's state can be neither read nor changed: every firewall operation of SystemInfo
// and of a ruleset throws HostCtlException. Loading the module loads the ruleset
// configuration into the data path (the firewall's filters); DestroyFirewallFilters() takes
// them out again, which a module needs before it may be unloaded. Dynamic rules are filters
// added at run time; they live until the configuration is reloaded (LoadFirewallRulesets)
// or the filters are destroyed.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "hostctl/lib/object.h"
#include "hostctl/network/types.h"

namespace HostCtl::System {

// A port rule of the firewall: a port range of one protocol in one direction.
class FirewallRule {
public:
    // Port types: the range applies to the destination or to the source port.
    static constexpr std::uint32_t PORT_TYPE_SRC = 0;
    static constexpr std::uint32_t PORT_TYPE_DST = 1;
    // Directions.
    static constexpr std::uint32_t DIRECTION_INBOUND = 0;
    static constexpr std::uint32_t DIRECTION_OUTBOUND = 1;
    // Protocols.
    static constexpr std::uint32_t PROTOCOL_TCP = 0;
    static constexpr std::uint32_t PROTOCOL_UDP = 1;

    FirewallRule() = default;
    FirewallRule(std::uint32_t portType, std::uint32_t portBegin, std::uint32_t portEnd,
                 std::uint32_t direction, std::uint32_t protocol)
        : portType_(portType),
          portBegin_(portBegin),
          portEnd_(portEnd),
          direction_(direction),
          protocol_(protocol) {}
    FirewallRule(const FirewallRule&) = default;
    FirewallRule& operator=(const FirewallRule&) = default;
    virtual ~FirewallRule();

    std::uint32_t GetPortType() const { return portType_; }
    void SetPortType(std::uint32_t portType) { portType_ = portType; }
    std::uint32_t GetPortBegin() const { return portBegin_; }
    void SetPortBegin(std::uint32_t port) { portBegin_ = port; }
    std::uint32_t GetPortEnd() const { return portEnd_; }
    void SetPortEnd(std::uint32_t port) { portEnd_ = port; }
    std::uint32_t GetDirection() const { return direction_; }
    void SetDirection(std::uint32_t direction) { direction_ = direction; }
    std::uint32_t GetProtocol() const { return protocol_; }
    void SetProtocol(std::uint32_t protocol) { protocol_ = protocol; }

    bool operator==(const FirewallRule& other) const {
        return portType_ == other.portType_ && portBegin_ == other.portBegin_ && portEnd_ == other.portEnd_ &&
               direction_ == other.direction_ && protocol_ == other.protocol_;
    }
    bool operator!=(const FirewallRule& other) const { return !(*this == other); }

private:
    std::uint32_t portType_ = PORT_TYPE_DST;
    std::uint32_t portBegin_ = 0;
    std::uint32_t portEnd_ = 0;
    std::uint32_t direction_ = DIRECTION_INBOUND;
    std::uint32_t protocol_ = PROTOCOL_TCP;
};

// The explicit allowed list of a ruleset, kept as four lists: IPv4 addresses, IPv4
// networks, IPv6 addresses and IPv6 networks, each in the order its entries were added.
// A network is kept with its host bits cleared ("192.0.2.0/24").
class FirewallAllowedIps {
public:
    const std::vector<Network::Ipv4Address>& GetIpv4Addresses() const { return ipv4Addresses_; }
    const std::vector<Network::Ipv4Network>& GetIpv4Networks() const { return ipv4Networks_; }
    const std::vector<Network::Ipv6Address>& GetIpv6Addresses() const { return ipv6Addresses_; }
    const std::vector<Network::Ipv6Network>& GetIpv6Networks() const { return ipv6Networks_; }

    void AddIpv4Address(const Network::Ipv4Address& address) { ipv4Addresses_.push_back(address); }
    void AddIpv4Network(const Network::Ipv4Network& network) { ipv4Networks_.push_back(network); }
    void AddIpv6Address(const Network::Ipv6Address& address) { ipv6Addresses_.push_back(address); }
    void AddIpv6Network(const Network::Ipv6Network& network) { ipv6Networks_.push_back(network); }

    bool IsEmpty() const {
        return ipv4Addresses_.empty() && ipv4Networks_.empty() && ipv6Addresses_.empty() &&
               ipv6Networks_.empty();
    }

private:
    std::vector<Network::Ipv4Address> ipv4Addresses_;
    std::vector<Network::Ipv4Network> ipv4Networks_;
    std::vector<Network::Ipv6Address> ipv6Addresses_;
    std::vector<Network::Ipv6Network> ipv6Networks_;
};

// A ruleset: a named group of port rules the firewall applies while the ruleset is enabled,
// to traffic from any address or only from the addresses on its allowed list. The object
// names the ruleset by its id and reads the host at each call; when no ruleset has that id
// (IsValid() false) the other operations throw.
class FirewallRuleset {
public:
    virtual ~FirewallRuleset();

    virtual std::string GetName() = 0;
    virtual bool IsEnabled() = 0;
    // Enabling an enabled ruleset (or disabling a disabled one) changes nothing.
    virtual void Enable() = 0;
    // The number of clients that keep the ruleset in use; never below zero.
    virtual std::int32_t GetClientCount() = 0;
    // One more client; enables the ruleset.
    virtual void AddClient() = 0;
    // One client less; the last one leaving disables the ruleset. Throws when it has none.
    virtual void RemoveClient() = 0;
    virtual void Disable() = 0;
    // The port rules, in the ruleset's order.
    virtual std::vector<std::unique_ptr<FirewallRule>> GetRules() = 0;
    // The explicit allowed list (kept, though unused, while all addresses are allowed).
    virtual std::unique_ptr<FirewallAllowedIps> GetAllowedIps() = 0;
    // Adds an IPv4 or IPv6 address, or a network in CIDR form ("address/prefix length").
    // Throws for any other text and for an entry already on the list.
    virtual void AddAllowedIp(const std::string& address) = 0;
    // Removes an entry given in the same notations; throws when it is not on the list.
    virtual void RemoveAllowedIp(const std::string& address) = 0;
    // Whether the id the ruleset was looked up by names a ruleset.
    virtual bool IsValid() = 0;
    virtual void SetAllowedAll(bool allowedAll) = 0;
    virtual bool IsAllowedAll() = 0;

protected:
    FirewallRuleset() = default;
    FirewallRuleset(const FirewallRuleset&) = default;
    FirewallRuleset& operator=(const FirewallRuleset&) = default;
};

// The host's system information: the firewall's global state, its rulesets and its
// dynamic rules. Every operation throws HostCtlException while the firewall module is not
// loaded.
class SystemInfo : public TknCtl::Lib::TknCtlObject {
public:
    ~SystemInfo() override;

    virtual bool IsFirewallEnabled() = 0;
    virtual void SetFirewallEnabled(bool enabled) = 0;
    // true: traffic that no ruleset admits passes; false: it is dropped.
    virtual bool GetFirewallDefaultAction() = 0;
    virtual void SetFirewallDefaultAction(bool pass) = 0;

    // Every ruleset, in the configuration's order.
    virtual std::vector<std::unique_ptr<FirewallRuleset>> GetFirewallRulesets() = 0;
    // The ruleset of that id; always an object, whose IsValid() tells whether the id exists.
    virtual std::unique_ptr<FirewallRuleset> GetFirewallRulesetById(const std::string& id) = 0;

    // (Re)loads the ruleset configuration into the data path; drops the dynamic rules.
    virtual void LoadFirewallRulesets() = 0;
    // Removes every filter (rulesets and dynamic rules) from the data path.
    virtual void DestroyFirewallFilters() = 0;
    // The dynamic rules now installed, in the order they were added.
    virtual std::vector<std::unique_ptr<FirewallRule>> GetFirewallDynamicRules() = 0;
    // Installs one dynamic rule; throws for a malformed rule or one already installed.
    virtual void AddFirewallDynamicRule(FirewallRule& rule) = 0;

protected:
    SystemInfo() = default;
};

}  // namespace HostCtl::System

namespace TknCtl::System {

class SystemInfoImpl : public HostCtl::System::SystemInfo {
public:
    SystemInfoImpl();
    ~SystemInfoImpl() override;

    bool IsFirewallEnabled() override;
    void SetFirewallEnabled(bool enabled) override;
    bool GetFirewallDefaultAction() override;
    void SetFirewallDefaultAction(bool pass) override;
    std::vector<std::unique_ptr<HostCtl::System::FirewallRuleset>> GetFirewallRulesets() override;
    std::unique_ptr<HostCtl::System::FirewallRuleset> GetFirewallRulesetById(const std::string& id) override;
    void LoadFirewallRulesets() override;
    void DestroyFirewallFilters() override;
    std::vector<std::unique_ptr<HostCtl::System::FirewallRule>> GetFirewallDynamicRules() override;
    void AddFirewallDynamicRule(HostCtl::System::FirewallRule& rule) override;
};

// A kernel module of the host, by name. Its loaded state is read from the host by
// Refresh(): a new object is stale and reports "not loaded" until it is refreshed.
class ModuleImpl : public Lib::TknCtlObject, public Lib::Refreshable {
public:
    explicit ModuleImpl(const std::string& name);
    ~ModuleImpl() override;

    const std::string& GetName() const { return name_; }
    // The loaded state as last refreshed (or as changed through this object).
    bool IsLoaded() const { return loaded_; }

    void Refresh() override;
    // Loads the module with an option string (the firewall module takes none). Loading a
    // module that is loaded already changes nothing unless force is set, in which case it
    // is unloaded (its filters dropped) and loaded again.
    void Load(const std::string& options, bool force);
    // Unloads the module; throws when it is not loaded or its filters are still installed.
    void Unload();

private:
    std::string name_;
    bool loaded_ = false;
};

}  // namespace TknCtl::System

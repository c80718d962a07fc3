// Tarkon interfaces inside the library: the interface object and the host-side effects of
// creating, configuring and removing an interface (its port, its routes, neighbours and
// multicast memberships).
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "backend/interfaces.h"
#include "hostctl/network/tknnic.h"
#include "model/tknnics.h"

namespace TknCtl::Network {

// An interface, named by its name.
class TknNicImpl : public HostCtl::Network::TknNic, public TknCtl::Lib::TknCtlObject {
public:
    explicit TknNicImpl(std::string name);
    ~TknNicImpl() override;

    std::string GetName() const override;
    std::string GetNetstackInstance() const override;
    HostCtl::Network::MacAddress GetMacAddress() const override;
    int GetMtu() const override;
    void SetMtu(int mtu) override;
    int GetTsoMss() const override;
    int GetRxDispQueueSize() const override;
    bool IsEnabled() const override;
    void Enable() override;
    void Disable() override;
    HostCtl::Network::IpConfig GetIpConfig() const override;
    HostCtl::Network::IpConfig GetDnsIpConfig() const override;
    void SetIpConfig(const HostCtl::Network::IpConfig& config) override;
    std::unique_ptr<HostCtl::Network::ConnectionPoint> GetConnectionPoint() const override;
    std::unique_ptr<HostCtl::Network::Port> GetPort() const override;
    void AddTag(HostCtl::Network::TknNicTagType tag, bool exclusive) override;
    void RemoveTag(HostCtl::Network::TknNicTagType tag) override;
    void GetTags(std::vector<HostCtl::Network::TknNicTagType>& tags) const override;
    void GetMulticastGroups(std::vector<MulticastGroup>& groups) const override;
    void Remove() override;
    void Refresh() override;

private:
    const Model::TknNic& Enter(const char* operation, const std::string& arguments = {}) const;

    std::string name_;
};

// An interface of a real host, named by its netstack and its name there: each operation keeps
// the rules every host shares and hands the rest to the host's interfaces area.
class RealTknNic : public HostCtl::Network::TknNic, public TknCtl::Lib::TknCtlObject {
public:
    explicit RealTknNic(Backend::InterfaceId id);
    ~RealTknNic() override;

    std::string GetName() const override;
    std::string GetNetstackInstance() const override;
    HostCtl::Network::MacAddress GetMacAddress() const override;
    int GetMtu() const override;
    void SetMtu(int mtu) override;
    int GetTsoMss() const override;
    int GetRxDispQueueSize() const override;
    bool IsEnabled() const override;
    void Enable() override;
    void Disable() override;
    HostCtl::Network::IpConfig GetIpConfig() const override;
    HostCtl::Network::IpConfig GetDnsIpConfig() const override;
    void SetIpConfig(const HostCtl::Network::IpConfig& config) override;
    std::unique_ptr<HostCtl::Network::ConnectionPoint> GetConnectionPoint() const override;
    std::unique_ptr<HostCtl::Network::Port> GetPort() const override;
    void AddTag(HostCtl::Network::TknNicTagType tag, bool exclusive) override;
    void RemoveTag(HostCtl::Network::TknNicTagType tag) override;
    void GetTags(std::vector<HostCtl::Network::TknNicTagType>& tags) const override;
    void GetMulticastGroups(std::vector<MulticastGroup>& groups) const override;
    void Remove() override;
    void Refresh() override;

private:
    // Starts an operation: the area of the real host, once the interface is known to exist.
    Backend::Interfaces& Enter(const char* operation, const std::string& arguments = {}) const;

    Backend::InterfaceId id_;
};

namespace Internal {

// The interfaces of a real host as interface objects.
std::vector<std::unique_ptr<HostCtl::Network::TknNic>> RealTknNics(
    const std::vector<Backend::InterfaceId>& ids);

// Rules every host keeps.
// A static IPv4 configuration of the interface name on netstack: a unicast host address (not
// the network or broadcast address of its subnet) with a contiguous netmask, a gateway on its
// subnet that is not the address itself, and an address no other interface of the netstack
// has (owner() names the one that has it, or is empty). An unset address goes with an unset
// netmask and gateway. Throws HostCtlException.
void CheckStaticIpv4(const std::string& name, const std::string& netstack,
                     const HostCtl::Network::IpConfig& config, const std::function<std::string()>& owner);
// The IPv6 gateway, and each address config has and before has not, are unicast; those
// addresses have a prefix length of 1 to 128. Throws HostCtlException.
void CheckIpv6(const HostCtl::Network::IpConfig& before, const HostCtl::Network::IpConfig& config);
// Throws HostCtlException for an MTU outside TknNic::MIN_MTU..MAX_MTU, or a tag type outside 1..8.
void CheckMtu(int mtu);
void CheckTagType(HostCtl::Network::TknNicTagType tag);

// The interface of that name, or a HostCtlException saying it does not exist.
const Model::TknNic& FindTknNic(const std::string& name);
Model::TknNic& FindTknNicForWrite(const std::string& name);

// The connection point as the model keeps it; throws for an unknown connection type.
Model::ConnectionPoint ToModelConnection(const HostCtl::Network::ConnectionPoint& point);
// A connection point object for the model's, or nothing for an interface without one.
std::unique_ptr<HostCtl::Network::ConnectionPoint> MakeConnectionPoint(const Model::ConnectionPoint& point);
// Whether two connection points name the same attachment (a distributed port's connection ID
// is not compared).
bool SameConnection(const Model::ConnectionPoint& a, const Model::ConnectionPoint& b);
// "port group 'VM Network'", "distributed port 12 of dvs-prod", ...
std::string DescribeConnection(const Model::ConnectionPoint& point);
// The name of the switch a connection point belongs to; empty when it does not exist.
std::string PortsetOf(const Model::ConnectionPoint& point);

// Checks that a new interface may attach at point: it exists and no interface or other
// client uses it, and its switch has a free port. Throws otherwise.
void CheckAttachable(const Model::ConnectionPoint& point);
// Gives the interface (already in the section) a port of its switch and marks the connection
// point in use (a distributed port keeps the interface's connection ID, or gives it its own
// when the interface has none); returns the port ID.
std::uint32_t Attach(Model::TknNic& nic);

// Removes the interface and everything that refers to it: its port (the switch's used ports
// and the port group's or distributed port's clients), its routes, neighbours and multicast
// memberships.
void RemoveTknNic(const std::string& name);

// The configuration config becomes when given to the interface nic, whose current
// configuration is previous (nothing for a new interface): the host's rules are applied and
// derived addresses added or taken away. Throws when config breaks a rule. Reads only.
HostCtl::Network::IpConfig CheckedIpConfig(const Model::TknNic& nic,
                                           const HostCtl::Network::IpConfig* previous,
                                           HostCtl::Network::IpConfig config);
// Brings what the host derives from the interface's configuration up to date: the address
// its port carries and its connected routes.
void SyncTknNic(const std::string& name);

}  // namespace Internal
}  // namespace TknCtl::Network

// Tarkon interfaces inside the library: the interface object and the host-side effects of
// creating, configuring and removing an interface (its port, its routes, neighbours and
// multicast memberships).
#pragma once

#include <memory>
#include <string>

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

namespace Internal {

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

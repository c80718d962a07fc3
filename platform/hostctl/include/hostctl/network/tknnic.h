// Tarkon network interfaces: the host's own IP interfaces ("tkn0" to "tkn255"), the
// information object that lists, creates and removes them, their tags, and the connection
// points they attach to (port groups, distributed ports, opaque networks).
//
// An interface object holds only the interface's name and reads the host at each call; once
// the interface is gone every call throws HostCtl::Lib::HostCtlException.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "hostctl/lib/object.h"
#include "hostctl/network/portset.h"
#include "hostctl/network/types.h"
#include "hostctl/network/vswitch.h"

namespace HostCtl::Network {

// Interface tag types 1 to 8: 1 "Management", 2 "Glidex", 3 "faultToleranceLogging",
// 4 "PellixReplication", 5 "PellixReplicationNFC", 6 "PellixProvisioning", 7 "Storage",
// 8 "StorageWitness". TKNNIC_TAG_INVALID stands for a name that is no tag.
using TknNicTagType = std::uint32_t;
constexpr TknNicTagType TKNNIC_TAG_FIRST = 1;
constexpr TknNicTagType TKNNIC_TAG_LAST = 8;
constexpr TknNicTagType TKNNIC_TAG_INVALID = 9;

// A Tarkon interface.
class TknNic : public TknCtl::Lib::Refreshable {
public:
    // Bounds of an interface MTU, both included.
    static constexpr int MIN_MTU = 1280;
    static constexpr int MAX_MTU = 9000;
    // What an interface gets when its creator leaves the choice to the host.
    static constexpr unsigned DEFAULT_MTU = 1500;
    static constexpr unsigned DEFAULT_RX_DISP_QUEUES = 1;
    static constexpr unsigned MAX_RX_DISP_QUEUES = 1000;
    static constexpr unsigned DEFAULT_TSO_MSS = 65535;

    // One multicast group membership of an interface.
    struct MulticastGroup {
        std::string interfaceName;
        std::string groupAddress;
        std::string linkLayerAddress;
        std::uint32_t refCount = 0;
    };

    virtual ~TknNic();

    virtual std::string GetName() const = 0;
    virtual std::string GetNetstackInstance() const = 0;
    virtual MacAddress GetMacAddress() const = 0;

    virtual int GetMtu() const = 0;
    // Throws when mtu lies outside MIN_MTU..MAX_MTU.
    virtual void SetMtu(int mtu) = 0;
    virtual int GetTsoMss() const = 0;
    virtual int GetRxDispQueueSize() const = 0;

    virtual bool IsEnabled() const = 0;
    virtual void Enable() = 0;
    virtual void Disable() = 0;

    // The configuration as it is stored and written back.
    virtual IpConfig GetIpConfig() const = 0;
    // The configuration whose DHCP DNS flags (GetDhcpDns, GetIpv6DhcpDns) are in force: a
    // flag is in force only while DHCP (IPv4) or DHCPv6 or router advertisement (IPv6) is on.
    virtual IpConfig GetDnsIpConfig() const = 0;
    // Replaces the configuration, with the rules of the host: DHCP and "none" clear the
    // static IPv4 settings (a DHCP lease is kept while DHCP stays on); a static address must
    // be a unicast host address with a contiguous netmask, unique on the netstack, and a
    // gateway must lie in its subnet; turning IPv6, router advertisement or DHCPv6 on adds the
    // link-local, autoconfigured or DHCPv6 addresses (origins 7 and 9), turning them off takes
    // those addresses away. Throws without changing anything when a rule is broken.
    virtual void SetIpConfig(const IpConfig& config) = 0;

    // The connection point, or nothing when the interface has none.
    virtual std::unique_ptr<ConnectionPoint> GetConnectionPoint() const = 0;
    // The virtual port the interface uses, or nothing.
    virtual std::unique_ptr<Port> GetPort() const = 0;

    // Tags. AddTag of a tag the interface carries changes nothing; with exclusive set, the
    // tag is taken from every other interface. RemoveTag throws when the interface does not
    // carry the tag. Both throw for a type outside 1..8.
    virtual void AddTag(TknNicTagType tag, bool exclusive) = 0;
    virtual void RemoveTag(TknNicTagType tag) = 0;
    // Appends the interface's tags in the order they were set.
    virtual void GetTags(std::vector<TknNicTagType>& tags) const = 0;

    // Appends the interface's multicast group memberships.
    virtual void GetMulticastGroups(std::vector<MulticastGroup>& groups) const = 0;

    // Removes the interface from the host: its port is freed and its routes, neighbours and
    // multicast memberships go with it.
    virtual void Remove() = 0;

    // Brings the interface's state in the host up to date with its configuration (the
    // address its port carries, its connected routes) and clears the stale flag. Throws when
    // the interface is gone.
    virtual void Refresh() = 0;

protected:
    TknNic() = default;
    TknNic(const TknNic&) = default;
    TknNic& operator=(const TknNic&) = default;
};

// The Tarkon interfaces of the host, as the network information object hands them out.
class TarkonNicInfo {
public:
    virtual ~TarkonNicInfo();
    // Every interface, in the host's order.
    virtual std::vector<std::unique_ptr<TknNic>> GetTarkonNics() = 0;
};

}  // namespace HostCtl::Network

namespace TknCtl::Network {

// The type of a tag name (exact spelling), or TKNNIC_TAG_INVALID. Needs no host session.
HostCtl::Network::TknNicTagType TknNicTagNameToId(const std::string& name);
// The name of a tag type; empty for a type outside 1..8. Needs no host session.
std::string TknNicTagIdToName(HostCtl::Network::TknNicTagType type);

// Lists, creates and removes the host's Tarkon interfaces.
class TarkonNicInfoImpl : public HostCtl::Network::TarkonNicInfo, public TknCtl::Lib::TknCtlObject {
public:
    TarkonNicInfoImpl();
    ~TarkonNicInfoImpl() override;

    std::vector<std::unique_ptr<HostCtl::Network::TknNic>> GetTarkonNics() override;
    // The interfaces of one netstack instance; throws for an unknown netstack.
    std::vector<std::unique_ptr<HostCtl::Network::TknNic>> GetTarkonNicsByInstanceKey(
        const std::string& netstack);
    // The interface of that name; nothing when there is none, unless mustExist is set (then
    // it throws).
    std::unique_ptr<HostCtl::Network::TknNic> GetTarkonNicByInterface(const std::string& name,
                                                                      bool mustExist);
    // The interfaces carrying the tag.
    std::vector<std::unique_ptr<HostCtl::Network::TknNic>> GetTarkonNicsByTag(
        HostCtl::Network::TknNicTagType tag);
    // Appends the names of the interfaces of one netstack instance; throws for an unknown one.
    void GetTarkonNicNamesByInstanceKey(std::vector<std::string>& names, const std::string& netstack);

    // Creates an interface at a connection point on a netstack instance and gives it a port of
    // the connection point's switch.
    //   name     "tknN"; empty takes the lowest free one. A name in use is refused.
    //   netstack must exist, except the dedicated "glidex", "faultTolerance" and
    //            "PellixProvisioning", which are created on first use; a netstack that is only
    //            configured is enabled by its first interface.
    //   mac      the unset address takes a unique locally administered one; otherwise it must
    //            be a unicast address no other interface or port uses.
    //   tsoMss   0: DEFAULT_TSO_MSS.   mtu: 0: DEFAULT_MTU, else MIN_MTU..MAX_MTU.
    //   rxQueues 0: DEFAULT_RX_DISP_QUEUES, else 1..MAX_RX_DISP_QUEUES.
    // A connection point that does not exist, or already carries an interface or another
    // client, is refused. Returns the new interface.
    std::unique_ptr<HostCtl::Network::TknNic> AddTarkonNic(HostCtl::Network::ConnectionPoint* connectionPoint,
                                                           const std::string& netstack,
                                                           const HostCtl::Network::IpConfig& config,
                                                           const HostCtl::Network::MacAddress& mac,
                                                           unsigned tsoMss, unsigned mtu, unsigned rxQueues,
                                                           const std::string& name);
    // Removes the interface of that netstack at the connection point (as TknNic::Remove);
    // throws when there is none.
    void RemoveTarkonNic(HostCtl::Network::ConnectionPoint* connectionPoint, const std::string& netstack);
};

// A port group as a connection point is TknCtl::Network::PortGroupImpl (vswitch.h).

// An opaque network as a connection point, with the name of its switch.
class OpaqueNetworkImpl : public HostCtl::Network::ConnectionPoint, public TknCtl::Lib::TknCtlObject {
public:
    OpaqueNetworkImpl(const HostCtl::Network::OpaqueNetworkParam& param, const std::string& portsetName);
    ~OpaqueNetworkImpl() override;

    std::string GetPortsetName() const override;
    // True while an interface is attached to the network (the host knows opaque networks
    // only through their attachments).
    bool IsValid() const override;
    int GetConnectionType() const override;
    std::string GetPortGroupName() const override;
    HostCtl::Network::DVPortParam GetDVPortParam() const override;
    HostCtl::Network::OpaqueNetworkParam GetOpaqueNetworkParam() const override;

private:
    HostCtl::Network::OpaqueNetworkParam param_;
    std::string portset_;
};

}  // namespace TknCtl::Network

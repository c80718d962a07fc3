// Switches (port sets) and their ports, distributed switches and ports, and connection points.
//
// Every switch of the host is a Portset: a standard switch (VirtualSwitch, see vswitch.h), a
// distributed switch (DVSwitch) or an opaque switch. Objects are owned by the caller and
// reflect the host at the time of the call.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "hostctl/lib/object.h"
#include "hostctl/network/types.h"

namespace HostCtl::Network {

// Defined in dvs.h.
struct PacketStats;
struct TrafficStats;
class FilterStats;
struct LacpConfig;
struct LacpStatus;
struct DVPortLacpState;

// The packet counters of one VLAN on an uplink.
struct VlanStats {
    std::uint32_t vlanId = 0;
    std::uint64_t packetsReceived = 0;
    std::uint64_t packetsSent = 0;
};

// A port of a switch.
class Port {
public:
    virtual ~Port();
    virtual std::uint32_t GetPortId() const = 0;
    // The World ID of the client using the port; 0 when none.
    virtual std::uint32_t GetClientWorldId() const = 0;
    // Port type code (4: an uplink port).
    virtual int GetPortType() const = 0;
    // The port group of a standard-switch port; empty otherwise.
    virtual std::string GetPortGroupName() const = 0;
    // The distributed port of a distributed-switch port; empty otherwise.
    virtual std::string GetDVPortId() const = 0;
    virtual MacAddress GetMacAddress() const = 0;
    virtual Ipv4Address GetIpAddress() const = 0;
    // The uplink the port's traffic currently leaves by; empty when none.
    virtual std::string GetTeamUplink() const = 0;
    virtual PacketStats GetPacketStats() const = 0;
    virtual TrafficStats GetTrafficStats() const = 0;
    virtual std::vector<std::unique_ptr<FilterStats>> GetFilterStats() const = 0;
};

// What every switch answers.
class Portset {
public:
    static constexpr std::uint32_t DEF_NUM_PORTS = 128;

    virtual ~Portset();
    virtual std::string GetName() const = 0;
    virtual std::string GetClassName() const = 0;
    virtual std::uint32_t GetNumPorts() const = 0;
    virtual std::uint32_t GetNumUsedPorts() const = 0;
    virtual std::uint32_t GetNumConfiguredPorts() const = 0;
    virtual int GetMtu() const = 0;
    // "down", "listen", "advertise" or "both".
    virtual std::string GetCdpStatus() const = 0;
    virtual std::vector<std::string> GetUplinkNames() const = 0;
    virtual std::vector<std::unique_ptr<Port>> GetPorts() const = 0;
    // VLAN statistics of one uplink; empty while their collection is off.
    virtual std::vector<VlanStats> GetVlanStats(const std::string& uplink) const = 0;
    virtual void SetVlanStatsEnabled(const std::string& uplink, bool enabled) = 0;
};

// A port of a distributed switch.
class DVPort {
public:
    virtual ~DVPort();
    virtual std::string GetPortId() const = 0;
    virtual std::string GetDVPortgroupId() const = 0;
    // Whether the port is in use; fills the names of its clients.
    virtual bool GetInUse(std::vector<std::string>& clients) const = 0;
    virtual DVPortLacpState GetLacpState() const = 0;
};

// A distributed switch.
class DVSwitch : public Portset {
public:
    virtual std::string GetDvsName() const = 0;
    virtual std::string GetUuid() const = 0;
    virtual std::int32_t GetBeaconTimeout() const = 0;
    virtual bool IsBranded() const = 0;
    virtual std::vector<std::unique_ptr<DVPort>> GetDVPorts() const = 0;
    virtual LacpConfig GetLacpConfig() const = 0;
    virtual std::vector<LacpStatus> GetLacpStatus() const = 0;
    virtual void SetLacpTimeout(int lagId, bool shortTimeout, const std::string& nicName) = 0;
};

// Where a Tarkon interface attaches.
class ConnectionPoint {
public:
    static constexpr int TYPE_PORTGROUP = 1;
    static constexpr int TYPE_DVPORT = 2;
    static constexpr int TYPE_OPAQUE_NETWORK = 3;

    virtual ~ConnectionPoint();
    // The name of the switch the connection point belongs to; empty when unknown.
    virtual std::string GetPortsetName() const = 0;
    // True when the port group, distributed port or opaque network exists.
    virtual bool IsValid() const = 0;
    virtual int GetConnectionType() const = 0;
    virtual std::string GetPortGroupName() const = 0;
    virtual DVPortParam GetDVPortParam() const = 0;
    virtual OpaqueNetworkParam GetOpaqueNetworkParam() const = 0;
};

}  // namespace HostCtl::Network

namespace TknCtl::Network {

class PortsetImpl {
public:
    // True when a standard switch of that name exists.
    static bool IsValidVirtualSwitch(const std::string& name);
};

// A distributed port, either as a connection point (named by a DVPortParam) or as a port of
// a switch (switch UUID and port ID).
class DVPortImpl : public HostCtl::Network::DVPort,
                   public HostCtl::Network::ConnectionPoint,
                   public TknCtl::Lib::TknCtlObject {
public:
    explicit DVPortImpl(const HostCtl::Network::DVPortParam& param);
    DVPortImpl(const std::string& switchUuid, const std::string& portId);
    ~DVPortImpl() override;

    std::string GetPortId() const override;
    std::string GetDVPortgroupId() const override;
    bool GetInUse(std::vector<std::string>& clients) const override;
    HostCtl::Network::DVPortLacpState GetLacpState() const override;

    std::string GetPortsetName() const override;
    bool IsValid() const override;
    int GetConnectionType() const override;
    std::string GetPortGroupName() const override;
    HostCtl::Network::DVPortParam GetDVPortParam() const override;
    HostCtl::Network::OpaqueNetworkParam GetOpaqueNetworkParam() const override;

    // The connection ID of the port's current connection; 0 when it has none.
    std::uint32_t GetConnectionId() const;
    void SetConnectionId(std::uint32_t connectionId);

private:
    HostCtl::Network::DVPortParam param_;
};

}  // namespace TknCtl::Network

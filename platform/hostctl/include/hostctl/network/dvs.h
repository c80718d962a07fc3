// Distributed switches and their LACP state, ports with their counters and filters, and the
// concrete classes the library hands out for them.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "hostctl/network/portset.h"

namespace HostCtl::Network {

// Packet counters of a port.
struct PacketStats {
    std::uint64_t packetsReceived = 0;
    std::uint64_t packetsSent = 0;
    std::uint64_t broadcastReceived = 0;
    std::uint64_t broadcastSent = 0;
    std::uint64_t multicastReceived = 0;
    std::uint64_t multicastSent = 0;
    std::uint64_t droppedReceived = 0;
    std::uint64_t droppedSent = 0;
};

// Byte counters of a port.
struct TrafficStats {
    std::uint64_t bytesReceived = 0;
    std::uint64_t bytesSent = 0;
};

// The counters of one packet filter attached to a port.
class FilterStats {
public:
    std::string name;
    bool valid = true;
    // false: the filter acts on what the port receives; true: on what it sends.
    bool direction = false;
    // The last five counters are kept.
    bool extendedValid = false;
    std::uint64_t packetsIn = 0;
    std::uint64_t packetsOut = 0;
    std::uint64_t packetsDropped = 0;
    std::uint64_t packetsFiltered = 0;
    std::uint64_t packetsFaulted = 0;
    std::uint64_t packetsQueued = 0;
    std::uint64_t packetsInjected = 0;
    std::uint64_t packetErrors = 0;
};

// Whether LACP is enabled on a distributed port, and its mode (1 active, 2 passive).
struct DVPortLacpState {
    bool enabled = false;
    std::uint32_t mode = 0;
};

// An uplink as a switch's LACP configuration lists it: its name, the NIC behind it and the
// distributed port it uses.
struct LacpUplink {
    std::string name;
    std::string nic;
    DVPortParam port;
};

// A link aggregation group; its members are the uplinks named NAME-0 .. NAME-(count-1).
struct LacpLag {
    std::string name;
    std::uint32_t id = 0;
    std::uint32_t uplinkCount = 0;
    std::uint32_t mode = 1;           // 1 active, 2 passive
    std::uint32_t loadBalancing = 0;  // 0 .. 20
};

// A switch's LACP configuration in one of two forms: one setting for the switch's uplink port
// group, carried by the uplink ports (switch-wide), or named LAGs (multiple-LAG).
struct LacpConfig {
    bool multipleLag = false;
    std::vector<LacpUplink> uplinks;
    std::vector<LacpLag> lags;
};

// The LACP state of one member NIC of a running LAG.
struct LacpMemberStatus {
    std::string nic;
    std::string state;
    std::uint16_t actorPortNumber = 0;
    std::uint16_t actorPortPriority = 0;
    std::uint16_t actorAdminKey = 0;
    std::uint16_t actorOperKey = 0;
    std::uint8_t actorState = 0;
    std::string actorFlags;
    std::uint16_t partnerPortNumber = 0;
    std::uint16_t partnerPortPriority = 0;
    std::uint16_t partnerOperKey = 0;
    std::uint8_t partnerState = 0;
    std::string partnerDeviceId;
    std::string partnerFlags;
    std::uint32_t age = 0;  // seconds
    std::uint64_t txLacpdus = 0;
    std::uint64_t txErrors = 0;
    std::uint64_t rxLacpdus = 0;
    std::uint64_t rxErrors = 0;
};

// A running LAG.
struct LacpStatus {
    std::int32_t lagId = 0;
    std::uint32_t mode = 1;  // 2 passive, anything else active
    std::vector<LacpMemberStatus> members;
};

}  // namespace HostCtl::Network

namespace TknCtl::Network {

// A port of any switch.
class PortImpl : public HostCtl::Network::Port, public TknCtl::Lib::TknCtlObject {
public:
    explicit PortImpl(std::uint32_t portId);
    ~PortImpl() override;

    std::uint32_t GetPortId() const override;
    std::uint32_t GetClientWorldId() const override;
    int GetPortType() const override;
    std::string GetPortGroupName() const override;
    std::string GetDVPortId() const override;
    HostCtl::Network::MacAddress GetMacAddress() const override;
    HostCtl::Network::Ipv4Address GetIpAddress() const override;
    std::string GetTeamUplink() const override;
    HostCtl::Network::PacketStats GetPacketStats() const override;
    HostCtl::Network::TrafficStats GetTrafficStats() const override;
    std::vector<std::unique_ptr<HostCtl::Network::FilterStats>> GetFilterStats() const override;

private:
    std::uint32_t portId_;
};

// A distributed switch, named by its name.
class DVSwitchImpl : public HostCtl::Network::DVSwitch, public TknCtl::Lib::TknCtlObject {
public:
    explicit DVSwitchImpl(std::string name);
    ~DVSwitchImpl() override;

    std::string GetName() const override;
    std::string GetClassName() const override;
    std::uint32_t GetNumPorts() const override;
    std::uint32_t GetNumUsedPorts() const override;
    std::uint32_t GetNumConfiguredPorts() const override;
    int GetMtu() const override;
    std::string GetCdpStatus() const override;
    std::vector<std::string> GetUplinkNames() const override;
    std::vector<std::unique_ptr<HostCtl::Network::Port>> GetPorts() const override;
    std::vector<HostCtl::Network::VlanStats> GetVlanStats(const std::string& uplink) const override;
    void SetVlanStatsEnabled(const std::string& uplink, bool enabled) override;

    std::string GetDvsName() const override;
    std::string GetUuid() const override;
    std::int32_t GetBeaconTimeout() const override;
    bool IsBranded() const override;
    std::vector<std::unique_ptr<HostCtl::Network::DVPort>> GetDVPorts() const override;
    HostCtl::Network::LacpConfig GetLacpConfig() const override;
    std::vector<HostCtl::Network::LacpStatus> GetLacpStatus() const override;
    void SetLacpTimeout(int lagId, bool shortTimeout, const std::string& nicName) override;

private:
    std::string name_;
};

}  // namespace TknCtl::Network

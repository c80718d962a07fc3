// Standard virtual switches, their port groups and their network policies.
//
// A standard switch (VirtualSwitch) is a Portset that also has beaconing, uplinks, port groups
// and three policies: NIC teaming (failover), port security and traffic shaping. A port group
// inherits every policy field from its switch unless it overrides it: its "own" policy holds
// only the overridden fields (those whose set mark is on), its "effective" policy is the own
// policy laid field by field over the switch's, and follows later changes of the switch.
//
// The policies are value types: copy one, edit it, hand it back with an Update operation.
// Every field carries a set mark, switched on by its setter and off by UnsetAll(); the
// getter of an unset field returns the field's default value.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "hostctl/lib/object.h"
#include "hostctl/network/portset.h"

namespace HostCtl::Network {

class VirtualSwitch;

// How a network outage is detected.
class LinkCriteriaSelectionPolicy {
public:
    // true: by the NIC's link state; false: by beacon probing.
    bool GetBeacon() const { return beacon_; }
    bool IsBeaconSet() const { return beaconSet_; }
    void SetBeacon(bool beacon) {
        beacon_ = beacon;
        beaconSet_ = true;
    }
    void UnsetAll() { *this = LinkCriteriaSelectionPolicy(); }

    bool operator==(const LinkCriteriaSelectionPolicy&) const = default;

private:
    bool beacon_ = false;
    bool beaconSet_ = false;
};

// NIC teaming (failover): how traffic is spread over the uplinks and which take over when one fails.
class NicTeamingPolicy {
public:
    // Teaming policy types; a host may report other codes, which stand for an unknown type.
    enum TeamPolicyType : int {
        TEAM_IPHASH = 1,    // hash of source and destination IP addresses
        TEAM_SRCMAC = 2,    // source MAC address
        TEAM_PORTID = 3,    // originating virtual port ID
        TEAM_EXPLICIT = 4,  // explicit failover order
    };

    // The host's policy for a new switch: originating port ID, notify switches, failback,
    // link-state detection; no uplink order (every uplink active, in the switch's order).
    static NicTeamingPolicy GetDefaultPolicy();

    TeamPolicyType GetTeamingPolicy() const { return teamingPolicy_; }
    bool IsTeamingPolicySet() const { return teamingPolicySet_; }
    void SetTeamingPolicy(TeamPolicyType type) {
        teamingPolicy_ = type;
        teamingPolicySet_ = true;
    }

    bool GetNotifySwitchOnFailure() const { return notifySwitch_; }
    bool IsNotifySwitchOnFailureSet() const { return notifySwitchSet_; }
    void SetNotifySwitchOnFailure(bool notify) {
        notifySwitch_ = notify;
        notifySwitchSet_ = true;
    }

    // Rolling restoration: a NIC back in service is not used again at once (no failback).
    bool GetRollingRestoration() const { return rollingRestoration_; }
    bool IsRollingRestorationSet() const { return rollingRestorationSet_; }
    void SetRollingRestoration(bool rolling) {
        rollingRestoration_ = rolling;
        rollingRestorationSet_ = true;
    }

    const LinkCriteriaSelectionPolicy& GetLinkCriteria() const { return linkCriteria_; }
    bool IsLinkCriteriaSet() const { return linkCriteriaSet_; }
    void SetLinkCriteria(const LinkCriteriaSelectionPolicy& criteria) {
        linkCriteria_ = criteria;
        linkCriteriaSet_ = true;
    }

    // Uplink names in failover order: the first GetMaxActiveUplinks() are active, the rest standby.
    const std::vector<std::string>& GetUplinkOrder() const { return uplinkOrder_; }
    bool IsUplinkOrderSet() const { return uplinkOrderSet_; }
    void SetUplinkOrder(const std::vector<std::string>& order) {
        uplinkOrder_ = order;
        uplinkOrderSet_ = true;
    }

    std::int32_t GetMaxActiveUplinks() const { return maxActive_; }
    bool IsMaxActiveUplinksSet() const { return maxActiveSet_; }
    void SetMaxActiveUplinks(int count) {
        maxActive_ = count;
        maxActiveSet_ = true;
    }

    void UnsetAll() { *this = NicTeamingPolicy(); }

    bool operator==(const NicTeamingPolicy&) const = default;

private:
    TeamPolicyType teamingPolicy_ = TEAM_PORTID;
    bool teamingPolicySet_ = false;
    bool notifySwitch_ = false;
    bool notifySwitchSet_ = false;
    bool rollingRestoration_ = false;
    bool rollingRestorationSet_ = false;
    LinkCriteriaSelectionPolicy linkCriteria_;
    bool linkCriteriaSet_ = false;
    std::vector<std::string> uplinkOrder_;
    bool uplinkOrderSet_ = false;
    std::int32_t maxActive_ = 0;
    bool maxActiveSet_ = false;
};

// Port security: what the ports of a switch or port group may do.
class PortSecurityPolicy {
public:
    // The host's policy for a new switch: nothing allowed.
    static PortSecurityPolicy GetDefaultPolicy();

    bool GetAllowPromiscuous() const { return promiscuous_; }
    bool IsAllowPromiscuousSet() const { return promiscuousSet_; }
    void SetAllowPromiscuous(bool allow) {
        promiscuous_ = allow;
        promiscuousSet_ = true;
    }

    bool GetAllowMacAddressChange() const { return macChange_; }
    bool IsAllowMacAddressChangeSet() const { return macChangeSet_; }
    void SetAllowMacAddressChange(bool allow) {
        macChange_ = allow;
        macChangeSet_ = true;
    }

    bool GetAllowForgedTransmits() const { return forgedTransmits_; }
    bool IsAllowForgedTransmitsSet() const { return forgedTransmitsSet_; }
    void SetAllowForgedTransmits(bool allow) {
        forgedTransmits_ = allow;
        forgedTransmitsSet_ = true;
    }

    void UnsetAll() { *this = PortSecurityPolicy(); }

    bool operator==(const PortSecurityPolicy&) const = default;

private:
    bool promiscuous_ = false;
    bool promiscuousSet_ = false;
    bool macChange_ = false;
    bool macChangeSet_ = false;
    bool forgedTransmits_ = false;
    bool forgedTransmitsSet_ = false;
};

// Traffic shaping of the ports' outgoing traffic.
class ShapingPolicy {
public:
    // The host's policy for a new switch: disabled, 100000 Kbps average and peak, 819200 Kib bursts.
    static ShapingPolicy GetDefaultPolicy();

    bool IsEnabled() const { return enabled_; }
    bool IsEnabledSet() const { return enabledSet_; }
    void SetEnabled(bool enabled) {
        enabled_ = enabled;
        enabledSet_ = true;
    }

    // Bits per second.
    std::uint64_t GetAverageBps() const { return averageBps_; }
    bool IsAverageBpsSet() const { return averageBpsSet_; }
    void SetAverageBps(std::uint64_t bps) {
        averageBps_ = bps;
        averageBpsSet_ = true;
    }

    // Bits per second.
    std::uint64_t GetPeakBps() const { return peakBps_; }
    bool IsPeakBpsSet() const { return peakBpsSet_; }
    void SetPeakBps(std::uint64_t bps) {
        peakBps_ = bps;
        peakBpsSet_ = true;
    }

    // Bytes.
    std::uint64_t GetBurstSize() const { return burstSize_; }
    bool IsBurstSizeSet() const { return burstSizeSet_; }
    void SetBurstSize(std::uint64_t bytes) {
        burstSize_ = bytes;
        burstSizeSet_ = true;
    }

    void UnsetAll() { *this = ShapingPolicy(); }

    bool operator==(const ShapingPolicy&) const = default;

private:
    bool enabled_ = false;
    bool enabledSet_ = false;
    std::uint64_t averageBps_ = 0;
    bool averageBpsSet_ = false;
    std::uint64_t peakBps_ = 0;
    bool peakBpsSet_ = false;
    std::uint64_t burstSize_ = 0;
    bool burstSizeSet_ = false;
};

// The offloads a switch uses on its uplinks.
class NicCapabilities {
public:
    // The host's capabilities for a new switch: every offload on.
    static NicCapabilities GetDefaultPolicy();

    bool GetCsumOffload() const { return csumOffload_; }
    bool IsCsumOffloadSet() const { return csumOffloadSet_; }
    void SetCsumOffload(bool on) {
        csumOffload_ = on;
        csumOffloadSet_ = true;
    }

    bool GetTcpSegmentation() const { return tcpSegmentation_; }
    bool IsTcpSegmentationSet() const { return tcpSegmentationSet_; }
    void SetTcpSegmentation(bool on) {
        tcpSegmentation_ = on;
        tcpSegmentationSet_ = true;
    }

    bool GetZeroCopyXmit() const { return zeroCopyXmit_; }
    bool IsZeroCopyXmitSet() const { return zeroCopyXmitSet_; }
    void SetZeroCopyXmit(bool on) {
        zeroCopyXmit_ = on;
        zeroCopyXmitSet_ = true;
    }

    void UnsetAll() { *this = NicCapabilities(); }

    bool operator==(const NicCapabilities&) const = default;

private:
    bool csumOffload_ = false;
    bool csumOffloadSet_ = false;
    bool tcpSegmentation_ = false;
    bool tcpSegmentationSet_ = false;
    bool zeroCopyXmit_ = false;
    bool zeroCopyXmitSet_ = false;
};

// A port group of a standard switch. Port-group names are unique on the host.
class PortGroup {
public:
    static constexpr std::uint16_t MIN_VLAN_ID = 0;
    static constexpr std::uint16_t MAX_VLAN_ID = 4095;

    virtual ~PortGroup();
    virtual std::string GetName() const = 0;
    virtual std::string GetVirtualSwitchName() const = 0;
    // The switch that holds the port group.
    virtual std::unique_ptr<VirtualSwitch> GetVirtualSwitch() const = 0;
    // Ports in use on the port group.
    virtual std::uint32_t GetActiveClients() const = 0;
    virtual std::uint16_t GetVlanId() const = 0;
    virtual void SetVlanId(std::uint16_t vlanId) = 0;

    // Effective policies (own overrides over the switch's), own policies (overrides only),
    // and the writing of the own policy (its unset fields follow the switch).
    virtual NicTeamingPolicy GetTeamingPolicy() const = 0;
    virtual NicTeamingPolicy GetOwnTeamingPolicy() const = 0;
    virtual void UpdateTeamingPolicy(const NicTeamingPolicy& policy) = 0;
    virtual PortSecurityPolicy GetSecurityPolicy() const = 0;
    virtual PortSecurityPolicy GetOwnSecurityPolicy() const = 0;
    virtual void UpdateSecurityPolicy(const PortSecurityPolicy& policy) = 0;
    virtual ShapingPolicy GetShapingPolicy() const = 0;
    virtual ShapingPolicy GetOwnShapingPolicy() const = 0;
    virtual void UpdateShapingPolicy(const ShapingPolicy& policy) = 0;
};

// A standard switch.
class VirtualSwitch : public Portset {
public:
    virtual bool IsBeaconEnabled() const = 0;
    virtual int GetBeaconInterval() const = 0;
    virtual int GetBeaconThreshold() const = 0;
    virtual std::vector<std::string> GetBeaconRequiredBy() const = 0;

    // Within the host's MTU bounds; the uplinks take the same MTU.
    virtual void SetMtu(int mtu) = 0;
    // 0 "down", 1 "listen", 2 "advertise", 3 "both".
    virtual void SetCdpStatus(int status) = 0;

    // An uplink is a physical NIC of the host that no other switch uses; it takes a port of
    // the switch. A removed uplink leaves the teaming orders of the switch and its port
    // groups. With force, removing an uplink the switch does not have is not an error.
    virtual void AddUplink(const std::string& name) = 0;
    virtual void RemoveUplink(const std::string& name, bool force) = 0;

    // Port groups in the switch's order.
    virtual std::vector<std::unique_ptr<PortGroup>> GetPortGroups() const = 0;
    virtual std::unique_ptr<PortGroup> AddPortGroup(const std::string& name) = 0;
    // Refused while Tarkon interfaces or VM ports use the port group.
    virtual void RemovePortGroup(const std::string& name) = 0;

    // The teaming policy in force (an unset uplink order stands for every uplink, all
    // active), and the one stored, which is what an edit starts from.
    virtual NicTeamingPolicy GetTeamingPolicy() const = 0;
    virtual NicTeamingPolicy GetStoredTeamingPolicy() const = 0;
    // The Update operations change the fields that are set in the policy given.
    virtual void UpdateTeamingPolicy(const NicTeamingPolicy& policy) = 0;
    virtual PortSecurityPolicy GetSecurityPolicy() const = 0;
    virtual void UpdateSecurityPolicy(const PortSecurityPolicy& policy) = 0;
    virtual ShapingPolicy GetShapingPolicy() const = 0;
    virtual void UpdateShapingPolicy(const ShapingPolicy& policy) = 0;
    virtual NicCapabilities GetNicCapabilities() const = 0;
};

}  // namespace HostCtl::Network

namespace TknCtl::Network {

// The host's standard switch of that name. Every operation reads the host anew and throws
// HostCtlException once the switch is gone.
class VirtualSwitchImpl : public HostCtl::Network::VirtualSwitch, public TknCtl::Lib::TknCtlObject {
public:
    explicit VirtualSwitchImpl(std::string name);
    ~VirtualSwitchImpl() override;

    // Portset
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

    // VirtualSwitch
    bool IsBeaconEnabled() const override;
    int GetBeaconInterval() const override;
    int GetBeaconThreshold() const override;
    std::vector<std::string> GetBeaconRequiredBy() const override;
    void SetMtu(int mtu) override;
    void SetCdpStatus(int status) override;
    void AddUplink(const std::string& name) override;
    void RemoveUplink(const std::string& name, bool force) override;
    std::vector<std::unique_ptr<HostCtl::Network::PortGroup>> GetPortGroups() const override;
    std::unique_ptr<HostCtl::Network::PortGroup> AddPortGroup(const std::string& name) override;
    void RemovePortGroup(const std::string& name) override;
    HostCtl::Network::NicTeamingPolicy GetTeamingPolicy() const override;
    HostCtl::Network::NicTeamingPolicy GetStoredTeamingPolicy() const override;
    void UpdateTeamingPolicy(const HostCtl::Network::NicTeamingPolicy& policy) override;
    HostCtl::Network::PortSecurityPolicy GetSecurityPolicy() const override;
    void UpdateSecurityPolicy(const HostCtl::Network::PortSecurityPolicy& policy) override;
    HostCtl::Network::ShapingPolicy GetShapingPolicy() const override;
    void UpdateShapingPolicy(const HostCtl::Network::ShapingPolicy& policy) override;
    HostCtl::Network::NicCapabilities GetNicCapabilities() const override;

private:
    std::string name_;
};

// The host's port group of that name, wherever it is. Every operation reads the host anew and
// throws HostCtlException once the port group is gone.
//
// A port group is also the connection point of a Tarkon interface (tknnic.h): as such its
// IsValid() says whether the port group exists and GetPortsetName() names its switch (empty
// when it does not exist); these operations never throw for a missing port group.
class PortGroupImpl : public HostCtl::Network::PortGroup,
                      public HostCtl::Network::ConnectionPoint,
                      public TknCtl::Lib::TknCtlObject {
public:
    explicit PortGroupImpl(std::string name);
    ~PortGroupImpl() override;

    // As a connection point (tknnic_connection.cpp).
    std::string GetPortsetName() const override;
    bool IsValid() const override;
    int GetConnectionType() const override;
    std::string GetPortGroupName() const override;
    HostCtl::Network::DVPortParam GetDVPortParam() const override;
    HostCtl::Network::OpaqueNetworkParam GetOpaqueNetworkParam() const override;

    std::string GetName() const override;
    std::string GetVirtualSwitchName() const override;
    std::unique_ptr<HostCtl::Network::VirtualSwitch> GetVirtualSwitch() const override;
    std::uint32_t GetActiveClients() const override;
    std::uint16_t GetVlanId() const override;
    void SetVlanId(std::uint16_t vlanId) override;
    HostCtl::Network::NicTeamingPolicy GetTeamingPolicy() const override;
    HostCtl::Network::NicTeamingPolicy GetOwnTeamingPolicy() const override;
    void UpdateTeamingPolicy(const HostCtl::Network::NicTeamingPolicy& policy) override;
    HostCtl::Network::PortSecurityPolicy GetSecurityPolicy() const override;
    HostCtl::Network::PortSecurityPolicy GetOwnSecurityPolicy() const override;
    void UpdateSecurityPolicy(const HostCtl::Network::PortSecurityPolicy& policy) override;
    HostCtl::Network::ShapingPolicy GetShapingPolicy() const override;
    HostCtl::Network::ShapingPolicy GetOwnShapingPolicy() const override;
    void UpdateShapingPolicy(const HostCtl::Network::ShapingPolicy& policy) override;

private:
    std::string name_;
};

}  // namespace TknCtl::Network

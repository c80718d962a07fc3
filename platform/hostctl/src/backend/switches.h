// Virtual switches, port groups and their policies on a real host; its distributed switches
// and ENS contexts.
//
// The operations (VirtualSwitchImpl, VirtualSwitchInfoImpl, PortGroupImpl, PortsetImpl, the
// factories, DVSwitchImpl, NetworkInfo's ENS operations) keep the rules both hosts share: how
// switch and port-group names, port counts, MTUs, CDP codes and VLAN IDs are checked, that a
// name is not taken twice, that an uplink is a physical NIC the switch has not got yet, how a
// port group's policies lie over its switch's and what a teaming policy may name. An area
// answers for what only the host knows and does: which switches and port groups it has, what
// they hold, and whether a change can be carried out (refused with a HostCtlException that
// says why, naming the kernel feature a host lacks).
//
// Policies travel as the library's value types. A switch's stored policy has every field set;
// a port group's own policy has set only the fields it overrides.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "hostctl/network/vswitch.h"

namespace TknCtl::Backend {

// A standard switch at one moment.
struct SwitchState {
    std::string name;
    std::string className;
    std::uint32_t numPorts = 0;
    std::uint32_t usedPorts = 0;
    std::uint32_t configuredPorts = 0;
    int mtu = 0;
    std::uint32_t cdpStatus = 0;  // 0 down, 1 listen, 2 advertise, 3 both
    bool beaconEnabled = false;
    int beaconInterval = 0;
    int beaconThreshold = 0;
    std::vector<std::string> beaconRequiredBy;
    std::vector<std::string> uplinks;     // physical NICs, in the switch's order
    std::vector<std::string> portGroups;  // in the switch's order
};

// A port group at one moment.
struct PortGroupState {
    std::string name;
    std::string vswitch;
    std::uint32_t activeClients = 0;
    std::uint16_t vlanId = 0;
};

// The three policies of a switch (stored: all set) or of a port group (own: overrides set).
struct SwitchPolicy {
    HostCtl::Network::NicTeamingPolicy teaming;
    HostCtl::Network::PortSecurityPolicy security;
    HostCtl::Network::ShapingPolicy shaping;

    bool operator==(const SwitchPolicy&) const = default;
};

class Switches {
public:
    virtual ~Switches();

    // ---- standard switches

    // The names of the standard switches, in the host's order.
    virtual std::vector<std::string> List() = 0;
    // Whether the host has a standard switch of that name (never throws for one it lacks).
    virtual bool Has(const std::string& name) = 0;
    // What a switch holds now, and its stored policy; both throw
    // HostCtlException("Virtual switch NAME does not exist") for a switch the host lacks.
    virtual SwitchState Read(const std::string& name) = 0;
    virtual SwitchPolicy ReadPolicy(const std::string& name) = 0;

    // A new switch with its port count and stored policy (the operation has checked the name,
    // the count, the policy, and that no switch of that name exists).
    virtual void Add(const std::string& name, std::uint32_t numPorts, const SwitchPolicy& policy) = 0;
    // Removes a switch with its port groups; refused while something the host cannot give up
    // uses it.
    virtual void Remove(const std::string& name) = 0;
    // The switch's MTU (checked against the host's bounds); its uplinks take it too.
    virtual void SetMtu(const std::string& name, int mtu) = 0;
    virtual void SetCdpStatus(const std::string& name, std::uint32_t status) = 0;
    // A physical NIC (the operation has checked that it is one and that the switch has it not)
    // becomes an uplink; refused when the host cannot give it to the switch.
    virtual void AddUplink(const std::string& name, const std::string& nic) = 0;
    // An uplink of the switch is given back.
    virtual void RemoveUplink(const std::string& name, const std::string& nic) = 0;
    // Stores one policy of the switch (complete) and carries it out on the switch's ports.
    virtual void WriteTeaming(const std::string& name, const HostCtl::Network::NicTeamingPolicy& policy) = 0;
    virtual void WriteSecurity(const std::string& name,
                               const HostCtl::Network::PortSecurityPolicy& policy) = 0;
    virtual void WriteShaping(const std::string& name, const HostCtl::Network::ShapingPolicy& policy) = 0;

    // ---- port groups (names are unique on the host)

    // Every port group, switch by switch in the host's order.
    virtual std::vector<PortGroupState> PortGroups() = 0;
    // The port group of that name, or nothing.
    virtual std::optional<PortGroupState> FindPortGroup(const std::string& name) = 0;
    // A port group's own policy; throws HostCtlException("Port group NAME does not exist").
    virtual SwitchPolicy ReadPortGroupPolicy(const std::string& name) = 0;
    // A new port group of a switch (the operation has checked the name and that no port group
    // has it).
    virtual void AddPortGroup(const std::string& vswitch, const std::string& name) = 0;
    // Removes a port group of the switch; refused while ports use it.
    virtual void RemovePortGroup(const std::string& vswitch, const std::string& name) = 0;
    // The VLAN of a port group (0 to 4095: 0 none, 4095 every VLAN), carried out on its ports.
    virtual void SetVlanId(const std::string& portGroup, std::uint16_t vlanId) = 0;
    // Stores one own policy of a port group and carries out what is in force on its ports.
    virtual void WritePortGroupTeaming(const std::string& name,
                                       const HostCtl::Network::NicTeamingPolicy& own) = 0;
    virtual void WritePortGroupSecurity(const std::string& name,
                                        const HostCtl::Network::PortSecurityPolicy& own) = 0;
    virtual void WritePortGroupShaping(const std::string& name,
                                       const HostCtl::Network::ShapingPolicy& own) = 0;

    // ---- what else the switch commands reach

    // The physical NICs uplinks are made of, in the host's order.
    virtual std::vector<std::string> PhysicalNics() = 0;
    // The names of the distributed switches, in the host's order.
    virtual std::vector<std::string> DistributedSwitches() = 0;
    // ENS contexts: throws HostCtlException saying why the host has none when it has none.
    virtual void RequireEns() = 0;
};

}  // namespace TknCtl::Backend

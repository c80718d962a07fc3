// Section "vswitches": the standard virtual switches with their uplinks, policies and port
// groups.
#pragma once

#include <cstdint>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "core/section.h"
#include "model/policy.h"

namespace TknCtl::Model {

// CDP status codes, index = code.
inline const char* const kCdpStatusNames[] = {"down", "listen", "advertise", "both"};

constexpr std::uint16_t kMaxVlanId = 4095;
// Ports of one standard switch, and of all switches of the host together.
constexpr std::uint32_t kMaxSwitchPorts = 4096;
constexpr std::uint32_t kMaxHostPorts = 4608;

struct PortGroup {
    std::string name;
    std::uint16_t vlanId = 0;
    Policy policy;                    // the port group's overrides only
    std::uint32_t activeClients = 0;  // ports in use on the port group
};

struct Beacon {
    bool enabled = false;
    std::uint32_t interval = 1;
    std::uint32_t threshold = 3;
    std::vector<std::string> requiredBy;
};

struct VSwitch {
    std::string name;  // "vSwitch0"
    std::string className = "etherswitch";
    std::uint32_t numPorts = 128;
    std::uint32_t configuredPorts = 128;
    std::uint32_t usedPorts = 0;  // kept up to date by whoever takes or frees a port
    std::uint32_t mtu = 1500;
    std::uint32_t cdpStatus = 1;  // kCdpStatusNames
    Beacon beacon;
    std::vector<std::string> uplinks;  // physical NIC names
    Policy policy;                     // the switch's stored policy
    Capabilities capabilities;         // offloads used on the uplinks
    std::vector<PortGroup> portGroups;
};

struct VSwitchesSection {
    static const Lib::SectionKind& Kind();
    std::vector<VSwitch> switches;

    const VSwitch* Find(const std::string& name) const;
    VSwitch* Find(const std::string& name);
    // The switch holding the port group, or nullptr; port-group names are unique host-wide.
    const VSwitch* FindPortGroupSwitch(const std::string& portGroup) const;
    const PortGroup* FindPortGroup(const std::string& portGroup) const;
    PortGroup* FindPortGroup(const std::string& portGroup);

    // Where the port-group lookups last saw each group (switch and group positions). Every
    // answer is checked against switches, so changes to them only cost a new index.
    mutable std::unordered_map<std::string, std::pair<std::size_t, std::size_t>> groupIndex;
};

}  // namespace TknCtl::Model

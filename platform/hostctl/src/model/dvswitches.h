// Section "dvswitches": the distributed switches with their ports, uplinks and LACP state.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "core/section.h"

namespace TknCtl::Model {

// LACP mode codes: 1 active, 2 passive. LACP forms of a switch: "switchWide" (one setting
// on the uplink port group, carried by the uplink ports) or "multipleLag" (named LAGs).
inline const char* const kLacpForms[] = {"none", "switchWide", "multipleLag"};
enum LacpForm : std::uint32_t { kLacpNone = 0, kLacpSwitchWide = 1, kLacpMultipleLag = 2 };

struct DvPortLacp {
    bool enabled = false;
    std::uint32_t mode = 0;
};

struct DvPort {
    std::string id;           // "12"
    std::string portgroupId;  // "dvportgroup-21"
    bool inUse = false;
    std::vector<std::string> clients;
    std::uint32_t connectionId = 0;
    DvPortLacp lacp;
};

// An uplink as LACP configuration lists it: its name ("lag1-0", or the NIC name in the
// switch-wide form), the NIC behind it and the distributed port it uses.
struct LacpUplink {
    std::string name;
    std::string nic;
    std::string portId;
};

struct Lag {
    std::string name;  // members are the uplinks named NAME-0 .. NAME-(uplinkCount-1)
    std::uint32_t id = 0;
    std::uint32_t uplinkCount = 0;
    std::uint32_t mode = 1;
    std::uint32_t loadBalancing = 0;  // 0..20
};

struct LacpActor {
    std::uint16_t portNumber = 0;
    std::uint16_t portPriority = 0;
    std::uint16_t adminKey = 0;
    std::uint16_t operKey = 0;
    std::uint8_t state = 0;  // IEEE 802.1AX state bits, bit 1 = short timeout
    std::string flags;
};

struct LacpPartner {
    std::uint16_t portNumber = 0;
    std::uint16_t portPriority = 0;
    std::uint16_t operKey = 0;
    std::uint8_t state = 0;
    std::string deviceId;
    std::string flags;
};

struct LacpMember {
    std::string nic;
    std::string state;  // "Bundled", ...
    LacpActor actor;
    LacpPartner partner;
    std::uint32_t age = 0;  // seconds
    std::uint64_t txLacpdus = 0;
    std::uint64_t txErrors = 0;
    std::uint64_t rxLacpdus = 0;
    std::uint64_t rxErrors = 0;
};

struct LagStatus {
    std::uint32_t lagId = 0;
    std::uint32_t mode = 1;
    std::vector<LacpMember> members;
};

struct LacpConfig {
    std::uint32_t form = kLacpNone;
    std::vector<LacpUplink> uplinks;
    std::vector<Lag> lags;          // multiple-LAG form
    std::vector<LagStatus> status;  // running LAGs
};

struct DvSwitch {
    std::string name;  // "dvs-prod"
    std::string uuid;
    std::string className = "cswitch";
    std::uint32_t numPorts = 0;
    std::uint32_t usedPorts = 0;
    std::uint32_t configuredPorts = 0;
    std::uint32_t mtu = 1500;
    std::uint32_t cdpStatus = 1;  // kCdpStatusNames
    std::int32_t beaconTimeout = -1;
    bool branded = true;
    std::vector<std::string> uplinks;  // physical NIC names
    std::vector<DvPort> ports;
    LacpConfig lacp;

    const DvPort* FindPort(const std::string& id) const;
    DvPort* FindPort(const std::string& id);
};

struct DvSwitchesSection {
    static const Lib::SectionKind& Kind();
    std::vector<DvSwitch> switches;

    const DvSwitch* Find(const std::string& name) const;
    DvSwitch* Find(const std::string& name);
    const DvSwitch* FindByUuid(const std::string& uuid) const;
};

}  // namespace TknCtl::Model

// Standard virtual switches: the switch object, its uplinks and port groups, and the creation,
// lookup and removal of switches.
#include <algorithm>
#include <cctype>

#include "backend/host.h"
#include "backend/switches.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/vswitch.h"
#include "model/dvswitches.h"
#include "model/ens.h"
#include "model/pnics.h"
#include "model/ports.h"
#include "model/tknnics.h"
#include "model/vswitches.h"
#include "network/internal.h"
#include "network/vswitch_model.h"

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;
namespace Pub = HostCtl::Network;
using VSwitchModel::FindSwitch;

namespace {

constexpr std::size_t kMaxSwitchNameLength = 31;
constexpr std::size_t kMaxPortGroupNameLength = 59;

void EnterPortset(const char* operation, const std::string& name, const std::string& arguments = {}) {
    Lib::Enter(std::string("HostCtl::Network::Portset::") + operation, name, arguments);
}

const Model::VSwitch& PortsetSwitch(const char* operation, const std::string& name) {
    EnterPortset(operation, name);
    return FindSwitch(name);
}

const Model::VSwitch& EnterSwitch(const char* operation, const std::string& name,
                                  const std::string& arguments = {}) {
    Lib::Enter(std::string("HostCtl::Network::VirtualSwitch::") + operation, name, arguments);
    return FindSwitch(name);
}

Model::VSwitch& WritableSwitch(const std::string& name) {
    FindSwitch(name);
    return *Lib::Write<Model::VSwitchesSection>().Find(name);
}

bool Contains(const std::vector<std::string>& names, const std::string& name) {
    return std::find(names.begin(), names.end(), name) != names.end();
}

// Switch names: letters, digits, '-', '_' and '.', starting with a letter or digit.
void CheckSwitchName(const std::string& name) {
    if (name.empty()) throw HostCtlException("Unable to create virtual switch: the name is empty");
    if (name.size() > kMaxSwitchNameLength) {
        throw HostCtlException("Unable to create virtual switch " + name + ": the name is longer than " +
                               std::to_string(kMaxSwitchNameLength) + " characters");
    }
    auto allowed = [](unsigned char c) { return std::isalnum(c) || c == '-' || c == '_' || c == '.'; };
    if (!std::isalnum(static_cast<unsigned char>(name.front())) ||
        !std::all_of(name.begin(), name.end(), allowed)) {
        throw HostCtlException(
            "Unable to create virtual switch '" + name +
            "': a name holds only letters, digits, '-', '_' and '.', and starts with a letter "
            "or digit");
    }
}

// Port-group names: printable characters (blanks inside only).
void CheckPortGroupName(const std::string& name) {
    if (name.empty()) throw HostCtlException("Unable to add port group: the name is empty");
    if (name.size() > kMaxPortGroupNameLength) {
        throw HostCtlException("Unable to add port group " + name + ": the name is longer than " +
                               std::to_string(kMaxPortGroupNameLength) + " characters");
    }
    auto printable = [](unsigned char c) { return c >= 0x20 && c < 0x7f; };
    if (!std::all_of(name.begin(), name.end(), printable) || name.front() == ' ' || name.back() == ' ') {
        throw HostCtlException(
            "Unable to add port group '" + name +
            "': a name holds only printable characters and neither starts nor ends with a blank");
    }
}

// Which switch, if any, uses a physical NIC as an uplink.
std::string UserOfNic(const std::string& nic, bool* distributed) {
    for (const auto& vswitch : Lib::Read<Model::VSwitchesSection>().switches) {
        if (Contains(vswitch.uplinks, nic)) {
            *distributed = false;
            return vswitch.name;
        }
    }
    for (const auto& dvs : Lib::Read<Model::DvSwitchesSection>().switches) {
        bool lacp = std::any_of(dvs.lacp.uplinks.begin(), dvs.lacp.uplinks.end(),
                                [&](const auto& uplink) { return uplink.nic == nic; });
        if (Contains(dvs.uplinks, nic) || lacp) {
            *distributed = true;
            return dvs.name;
        }
    }
    return {};
}

// ---------------------------------------------------------------- the real host

// On a real host: the hook of a port-set or switch operation, then the host's switch area,
// which answers for the switch (and refuses one it lacks). Nothing on the simulated host.
Backend::Switches* RealPortset(const char* operation, const std::string& name,
                               const std::string& arguments = {}) {
    auto* real = VSwitchModel::RealSwitches();
    if (real) EnterPortset(operation, name, arguments);
    return real;
}

Backend::Switches* RealSwitch(const char* operation, const std::string& name,
                              const std::string& arguments = {}) {
    auto* real = VSwitchModel::RealSwitches();
    if (real) Lib::Enter(std::string("HostCtl::Network::VirtualSwitch::") + operation, name, arguments);
    return real;
}

Backend::SwitchState RealState(const char* operation, const std::string& name) {
    return RealPortset(operation, name)->Read(name);
}

void AddRealUplink(Backend::Switches& real, const std::string& vswitch, const std::string& nic) {
    const std::string refused = "Unable to add uplink " + nic + " to virtual switch " + vswitch + ": ";
    const auto state = real.Read(vswitch);
    if (!Contains(real.PhysicalNics(), nic))
        throw HostCtlException(refused + "the host has no physical NIC of that name");
    if (Contains(state.uplinks, nic)) throw HostCtlException(refused + "the switch already has it");
    if (state.usedPorts >= state.numPorts) throw HostCtlException(refused + "the switch has no free port");
    real.AddUplink(vswitch, nic);
}

void RemoveRealUplink(Backend::Switches& real, const std::string& vswitch, const std::string& nic,
                      bool force) {
    const auto state = real.Read(vswitch);
    if (!Contains(state.uplinks, nic)) {
        if (force) return;
        throw HostCtlException("Unable to remove uplink " + nic + " from virtual switch " + vswitch +
                               ": the switch has no such uplink");
    }
    real.RemoveUplink(vswitch, nic);
    // A removed uplink leaves the failover orders of the switch and its port groups.
    auto teaming = VSwitchModel::ToModel(real.ReadPolicy(vswitch).teaming);
    const auto before = teaming.uplinkOrder;
    VSwitchModel::DropFromOrder(teaming, nic);
    if (teaming.uplinkOrder != before) real.WriteTeaming(vswitch, VSwitchModel::ToPublic(teaming));
    for (const auto& group : state.portGroups) {
        auto own = VSwitchModel::ToModel(real.ReadPortGroupPolicy(group).teaming);
        const auto held = own.uplinkOrder;
        VSwitchModel::DropFromOrder(own, nic);
        if (own.uplinkOrder != held) real.WritePortGroupTeaming(group, VSwitchModel::ToPublic(own));
    }
}

// A free port ID: next to the switch's other ports, or at the start of a block of its own.
std::uint32_t NewPortId(const Model::PortsSection& ports, const std::string& switchName) {
    std::uint32_t candidate = 0;
    std::uint32_t lastBlock = 0;
    for (const auto& port : ports.ports) {
        lastBlock = std::max(lastBlock, port.id >> 24);
        if (port.switchName == switchName) candidate = std::max(candidate, port.id + 1);
    }
    if (candidate == 0) candidate = ((lastBlock + 1) << 24) | 2;
    while (ports.Find(candidate) || candidate == 0)
        ++candidate;
    return candidate;
}

// The uplink traffic of a port leaves by: the first active uplink of its teaming order that
// the switch still has, else the first uplink of the switch, else none.
std::string TeamUplinkFor(const Model::VSwitch& vswitch, const std::string& portGroup) {
    Model::TeamingPolicy teaming = VSwitchModel::EffectiveTeaming(vswitch);
    for (const auto& group : vswitch.portGroups) {
        if (group.name == portGroup) teaming = VSwitchModel::EffectiveTeaming(vswitch, group);
    }
    const auto& order = *teaming.uplinkOrder;
    auto active =
        std::min<std::size_t>(order.size(), static_cast<std::size_t>(std::max(0, *teaming.maxActive)));
    for (std::size_t i = 0; i < active; ++i) {
        if (Contains(vswitch.uplinks, order[i])) return order[i];
    }
    return vswitch.uplinks.empty() ? std::string() : vswitch.uplinks.front();
}

}  // namespace

// ---------------------------------------------------------------- the switch as a port set

VirtualSwitchImpl::VirtualSwitchImpl(std::string name) : name_(std::move(name)) {}
VirtualSwitchImpl::~VirtualSwitchImpl() = default;

std::string VirtualSwitchImpl::GetName() const {
    EnterPortset("GetName", name_);
    return name_;
}
std::string VirtualSwitchImpl::GetClassName() const {
    if (VSwitchModel::RealSwitches()) return RealState("GetClassName", name_).className;
    return PortsetSwitch("GetClassName", name_).className;
}
std::uint32_t VirtualSwitchImpl::GetNumPorts() const {
    if (VSwitchModel::RealSwitches()) return RealState("GetNumPorts", name_).numPorts;
    return PortsetSwitch("GetNumPorts", name_).numPorts;
}
std::uint32_t VirtualSwitchImpl::GetNumUsedPorts() const {
    if (VSwitchModel::RealSwitches()) return RealState("GetNumUsedPorts", name_).usedPorts;
    return PortsetSwitch("GetNumUsedPorts", name_).usedPorts;
}
std::uint32_t VirtualSwitchImpl::GetNumConfiguredPorts() const {
    if (VSwitchModel::RealSwitches()) return RealState("GetNumConfiguredPorts", name_).configuredPorts;
    return PortsetSwitch("GetNumConfiguredPorts", name_).configuredPorts;
}
int VirtualSwitchImpl::GetMtu() const {
    if (VSwitchModel::RealSwitches()) return RealState("GetMtu", name_).mtu;
    return static_cast<int>(PortsetSwitch("GetMtu", name_).mtu);
}
std::string VirtualSwitchImpl::GetCdpStatus() const {
    if (VSwitchModel::RealSwitches())
        return Internal::CdpStatusText(RealState("GetCdpStatus", name_).cdpStatus);
    return Internal::CdpStatusText(PortsetSwitch("GetCdpStatus", name_).cdpStatus);
}
std::vector<std::string> VirtualSwitchImpl::GetUplinkNames() const {
    if (VSwitchModel::RealSwitches()) return RealState("GetUplinkNames", name_).uplinks;
    return PortsetSwitch("GetUplinkNames", name_).uplinks;
}
std::vector<std::unique_ptr<Pub::Port>> VirtualSwitchImpl::GetPorts() const {
    // A real host's bridge ports are its uplinks and the ends of its interfaces: none is a
    // virtual machine's port that the port commands serve.
    if (VSwitchModel::RealSwitches()) {
        RealState("GetPorts", name_);
        return {};
    }
    PortsetSwitch("GetPorts", name_);
    return Internal::PortsOfSwitch(name_);
}
std::vector<Pub::VlanStats> VirtualSwitchImpl::GetVlanStats(const std::string& uplink) const {
    EnterPortset("GetVlanStats", name_, uplink);
    return Internal::UplinkVlanStats(name_, uplink);
}
void VirtualSwitchImpl::SetVlanStatsEnabled(const std::string& uplink, bool enabled) {
    EnterPortset("SetVlanStatsEnabled", name_, Lib::Args(uplink, enabled));
    Internal::SetUplinkVlanStatsEnabled(name_, uplink, enabled);
}

// ---------------------------------------------------------------- beaconing, MTU, CDP

bool VirtualSwitchImpl::IsBeaconEnabled() const {
    if (auto* real = RealSwitch("IsBeaconEnabled", name_)) return real->Read(name_).beaconEnabled;
    return EnterSwitch("IsBeaconEnabled", name_).beacon.enabled;
}
int VirtualSwitchImpl::GetBeaconInterval() const {
    if (auto* real = RealSwitch("GetBeaconInterval", name_)) return real->Read(name_).beaconInterval;
    return static_cast<int>(EnterSwitch("GetBeaconInterval", name_).beacon.interval);
}
int VirtualSwitchImpl::GetBeaconThreshold() const {
    if (auto* real = RealSwitch("GetBeaconThreshold", name_)) return real->Read(name_).beaconThreshold;
    return static_cast<int>(EnterSwitch("GetBeaconThreshold", name_).beacon.threshold);
}
std::vector<std::string> VirtualSwitchImpl::GetBeaconRequiredBy() const {
    if (auto* real = RealSwitch("GetBeaconRequiredBy", name_)) return real->Read(name_).beaconRequiredBy;
    return EnterSwitch("GetBeaconRequiredBy", name_).beacon.requiredBy;
}

void VirtualSwitchImpl::SetMtu(int mtu) {
    auto* real = RealSwitch("SetMtu", name_, Lib::Args(mtu));
    if (!real) EnterSwitch("SetMtu", name_, Lib::Args(mtu));
    if (mtu < static_cast<int>(Model::kMinMtu) || mtu > static_cast<int>(Model::kMaxMtu)) {
        throw HostCtlException("Unable to set the MTU of virtual switch " + name_ +
                               ": the MTU must be between " + std::to_string(Model::kMinMtu) + " and " +
                               std::to_string(Model::kMaxMtu));
    }
    if (real) return real->SetMtu(name_, mtu);
    auto& vswitch = WritableSwitch(name_);
    vswitch.mtu = static_cast<std::uint32_t>(mtu);
    // The uplinks carry the switch's frames: they take its MTU.
    auto& pnics = Lib::Write<Model::PnicsSection>();
    for (const auto& uplink : vswitch.uplinks) {
        if (auto* nic = pnics.Find(uplink)) nic->mtu = vswitch.mtu;
    }
}

void VirtualSwitchImpl::SetCdpStatus(int status) {
    auto* real = RealSwitch("SetCdpStatus", name_, Lib::Args(status));
    if (!real) EnterSwitch("SetCdpStatus", name_, Lib::Args(status));
    if (status < 0 || status >= static_cast<int>(std::size(Model::kCdpStatusNames))) {
        throw HostCtlException("Unable to set the CDP status of virtual switch " + name_ +
                               ": unknown status code " + std::to_string(status));
    }
    if (real) return real->SetCdpStatus(name_, static_cast<std::uint32_t>(status));
    WritableSwitch(name_).cdpStatus = static_cast<std::uint32_t>(status);
}

// ---------------------------------------------------------------- uplinks

void VirtualSwitchImpl::AddUplink(const std::string& name) {
    if (auto* real = RealSwitch("AddUplink", name_, name)) return AddRealUplink(*real, name_, name);
    const auto& current = EnterSwitch("AddUplink", name_, name);
    const std::string refused = "Unable to add uplink " + name + " to virtual switch " + name_ + ": ";
    const auto* nic = Lib::Read<Model::PnicsSection>().Find(name);
    if (!nic) throw HostCtlException(refused + "the host has no physical NIC of that name");
    if (Contains(current.uplinks, name)) throw HostCtlException(refused + "the switch already has it");
    bool distributed = false;
    std::string user = UserOfNic(name, &distributed);
    if (!user.empty()) {
        throw HostCtlException(refused + "it is an uplink of " +
                               (distributed ? "distributed switch " : "virtual switch ") + user);
    }
    if (current.usedPorts >= current.numPorts)
        throw HostCtlException(refused + "the switch has no free port");

    auto& ports = Lib::Write<Model::PortsSection>();
    Model::Port port;
    port.id = NewPortId(ports, name_);
    port.switchName = name_;
    port.type = Model::kPortUplink;
    port.client = name;
    port.mac = nic->mac;
    ports.ports.push_back(std::move(port));

    auto& vswitch = WritableSwitch(name_);
    vswitch.uplinks.push_back(name);
    ++vswitch.usedPorts;
    Lib::Write<Model::PnicsSection>().Find(name)->mtu = vswitch.mtu;
}

void VirtualSwitchImpl::RemoveUplink(const std::string& name, bool force) {
    if (auto* real = RealSwitch("RemoveUplink", name_, Lib::Args(name, force)))
        return RemoveRealUplink(*real, name_, name, force);
    const auto& current = EnterSwitch("RemoveUplink", name_, Lib::Args(name, force));
    if (!Contains(current.uplinks, name)) {
        if (force) return;
        throw HostCtlException("Unable to remove uplink " + name + " from virtual switch " + name_ +
                               ": the switch has no such uplink");
    }
    auto& vswitch = WritableSwitch(name_);
    vswitch.uplinks.erase(std::find(vswitch.uplinks.begin(), vswitch.uplinks.end(), name));
    VSwitchModel::DropFromOrder(vswitch.policy.teaming, name);
    for (auto& group : vswitch.portGroups)
        VSwitchModel::DropFromOrder(group.policy.teaming, name);

    // The uplink's port goes; ports whose traffic left by it move to another uplink.
    auto& ports = Lib::Write<Model::PortsSection>().ports;
    auto before = ports.size();
    std::erase_if(ports, [&](const Model::Port& port) {
        return port.switchName == name_ && port.type == Model::kPortUplink && port.client == name;
    });
    auto freed = static_cast<std::uint32_t>(before - ports.size());
    vswitch.usedPorts -= std::min(vswitch.usedPorts, freed);
    for (auto& port : ports) {
        if (port.switchName == name_ && port.teamUplink == name)
            port.teamUplink = TeamUplinkFor(vswitch, port.portGroup);
    }
}

// ---------------------------------------------------------------- port groups

std::vector<std::unique_ptr<Pub::PortGroup>> VirtualSwitchImpl::GetPortGroups() const {
    std::vector<std::unique_ptr<Pub::PortGroup>> groups;
    if (auto* real = RealSwitch("GetPortGroups", name_)) {
        for (const auto& group : real->Read(name_).portGroups)
            groups.push_back(std::make_unique<PortGroupImpl>(group));
        return groups;
    }
    for (const auto& group : EnterSwitch("GetPortGroups", name_).portGroups)
        groups.push_back(std::make_unique<PortGroupImpl>(group.name));
    return groups;
}

std::unique_ptr<Pub::PortGroup> VirtualSwitchImpl::AddPortGroup(const std::string& name) {
    auto* real = RealSwitch("AddPortGroup", name_, name);
    if (!real) EnterSwitch("AddPortGroup", name_, name);
    CheckPortGroupName(name);
    if (real) {
        real->Read(name_);  // the switch exists
        if (auto holder = real->FindPortGroup(name)) {
            throw HostCtlException("Unable to add port group " + name + ": virtual switch " +
                                   holder->vswitch + " already has a port group of that name");
        }
        real->AddPortGroup(name_, name);
        return std::make_unique<PortGroupImpl>(name);
    }
    const auto& section = Lib::Read<Model::VSwitchesSection>();
    if (const auto* holder = section.FindPortGroupSwitch(name)) {
        throw HostCtlException("Unable to add port group " + name + ": virtual switch " + holder->name +
                               " already has a port group of that name");
    }
    Model::PortGroup group;
    group.name = name;
    WritableSwitch(name_).portGroups.push_back(std::move(group));
    return std::make_unique<PortGroupImpl>(name);
}

void VirtualSwitchImpl::RemovePortGroup(const std::string& name) {
    if (auto* real = RealSwitch("RemovePortGroup", name_, name)) return real->RemovePortGroup(name_, name);
    const auto& current = EnterSwitch("RemovePortGroup", name_, name);
    const std::string refused =
        "Unable to remove port group " + name + " from virtual switch " + name_ + ": ";
    bool held = std::any_of(current.portGroups.begin(), current.portGroups.end(),
                            [&](const Model::PortGroup& group) { return group.name == name; });
    if (!held) throw HostCtlException(refused + "the switch has no such port group");
    for (const auto& nic : Lib::Read<Model::TknNicsSection>().nics) {
        if (nic.connection.type == Model::ConnectionPoint::kPortGroup && nic.connection.portGroup == name)
            throw HostCtlException(refused + "Tarkon interface " + nic.name + " is connected to it");
    }
    std::size_t vmPorts = 0;
    std::size_t otherPorts = 0;
    for (const auto& port : Lib::Read<Model::PortsSection>().ports) {
        if (port.switchName != name_ || port.portGroup != name) continue;
        ++(port.type == Model::kPortVm ? vmPorts : otherPorts);
    }
    if (vmPorts)
        throw HostCtlException(refused + std::to_string(vmPorts) + " virtual machine port(s) use it");
    if (otherPorts) throw HostCtlException(refused + std::to_string(otherPorts) + " port(s) use it");
    std::erase_if(WritableSwitch(name_).portGroups,
                  [&](const Model::PortGroup& group) { return group.name == name; });
}

// ---------------------------------------------------------------- policies

Pub::NicTeamingPolicy VirtualSwitchImpl::GetTeamingPolicy() const {
    if (auto* real = RealSwitch("GetTeamingPolicy", name_))
        return VSwitchModel::ToPublic(
            VSwitchModel::EffectiveTeaming(VSwitchModel::RealSwitchModel(*real, name_)));
    return VSwitchModel::ToPublic(VSwitchModel::EffectiveTeaming(EnterSwitch("GetTeamingPolicy", name_)));
}

Pub::NicTeamingPolicy VirtualSwitchImpl::GetStoredTeamingPolicy() const {
    if (auto* real = RealSwitch("GetStoredTeamingPolicy", name_)) return real->ReadPolicy(name_).teaming;
    return VSwitchModel::ToPublic(EnterSwitch("GetStoredTeamingPolicy", name_).policy.teaming);
}

void VirtualSwitchImpl::UpdateTeamingPolicy(const Pub::NicTeamingPolicy& policy) {
    if (auto* real = RealSwitch("UpdateTeamingPolicy", name_)) {
        const auto current = VSwitchModel::RealSwitchModel(*real, name_);
        auto given = VSwitchModel::ToModel(policy);
        VSwitchModel::CheckTeaming(given, current, "virtual switch " + name_);
        return real->WriteTeaming(name_,
                                  VSwitchModel::ToPublic(Model::Overlay(current.policy.teaming, given)));
    }
    const auto& current = EnterSwitch("UpdateTeamingPolicy", name_);
    auto given = VSwitchModel::ToModel(policy);
    VSwitchModel::CheckTeaming(given, current, "virtual switch " + name_);
    auto& vswitch = WritableSwitch(name_);
    vswitch.policy.teaming = Model::Overlay(vswitch.policy.teaming, given);
}

Pub::PortSecurityPolicy VirtualSwitchImpl::GetSecurityPolicy() const {
    if (auto* real = RealSwitch("GetSecurityPolicy", name_)) return real->ReadPolicy(name_).security;
    return VSwitchModel::ToPublic(EnterSwitch("GetSecurityPolicy", name_).policy.security);
}

void VirtualSwitchImpl::UpdateSecurityPolicy(const Pub::PortSecurityPolicy& policy) {
    if (auto* real = RealSwitch("UpdateSecurityPolicy", name_)) {
        const auto stored = VSwitchModel::ToModel(real->ReadPolicy(name_).security);
        return real->WriteSecurity(
            name_, VSwitchModel::ToPublic(Model::Overlay(stored, VSwitchModel::ToModel(policy))));
    }
    EnterSwitch("UpdateSecurityPolicy", name_);
    auto& vswitch = WritableSwitch(name_);
    vswitch.policy.security = Model::Overlay(vswitch.policy.security, VSwitchModel::ToModel(policy));
}

Pub::ShapingPolicy VirtualSwitchImpl::GetShapingPolicy() const {
    if (auto* real = RealSwitch("GetShapingPolicy", name_)) return real->ReadPolicy(name_).shaping;
    return VSwitchModel::ToPublic(EnterSwitch("GetShapingPolicy", name_).policy.shaping);
}

void VirtualSwitchImpl::UpdateShapingPolicy(const Pub::ShapingPolicy& policy) {
    if (auto* real = RealSwitch("UpdateShapingPolicy", name_)) {
        const auto stored = VSwitchModel::ToModel(real->ReadPolicy(name_).shaping);
        return real->WriteShaping(
            name_, VSwitchModel::ToPublic(Model::Overlay(stored, VSwitchModel::ToModel(policy))));
    }
    EnterSwitch("UpdateShapingPolicy", name_);
    auto& vswitch = WritableSwitch(name_);
    vswitch.policy.shaping = Model::Overlay(vswitch.policy.shaping, VSwitchModel::ToModel(policy));
}

Pub::NicCapabilities VirtualSwitchImpl::GetNicCapabilities() const {
    // A bridge uses the offloads its ports have: the host's defaults stand for them.
    if (auto* real = RealSwitch("GetNicCapabilities", name_)) {
        real->Read(name_);
        return VSwitchModel::ToPublic(VSwitchModel::DefaultCapabilities());
    }
    return VSwitchModel::ToPublic(EnterSwitch("GetNicCapabilities", name_).capabilities);
}

// ---------------------------------------------------------------- creation, lookup, removal

std::unique_ptr<Pub::VirtualSwitch> VirtualSwitchInfoImpl::AddVirtualSwitchWithPolicy(
    const Pub::NicTeamingPolicy& teaming, const Pub::PortSecurityPolicy& security,
    const Pub::ShapingPolicy& shaping, const Pub::NicCapabilities& capabilities, const std::string& name,
    std::uint32_t numPorts) {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::AddVirtualSwitchWithPolicy", name,
               Lib::Args(numPorts));
    CheckSwitchName(name);
    const std::string refused = "Unable to create virtual switch " + name + ": ";
    if (auto* real = VSwitchModel::RealSwitches()) {
        if (real->Has(name)) throw HostCtlException(refused + "a virtual switch of that name exists");
        if (Contains(real->DistributedSwitches(), name))
            throw HostCtlException(refused + "a distributed switch of that name exists");
        if (numPorts < 1 || numPorts > Model::kMaxSwitchPorts) {
            throw HostCtlException(refused + "a virtual switch has 1 to " +
                                   std::to_string(Model::kMaxSwitchPorts) + " ports, not " +
                                   std::to_string(numPorts));
        }
        std::uint64_t allocated = 0;
        for (const auto& other : real->List())
            allocated += real->Read(other).numPorts;
        if (allocated + numPorts > Model::kMaxHostPorts) {
            std::uint64_t left = allocated < Model::kMaxHostPorts ? Model::kMaxHostPorts - allocated : 0;
            throw HostCtlException(refused + std::to_string(numPorts) + " ports requested, but only " +
                                   std::to_string(left) + " of the host's " +
                                   std::to_string(Model::kMaxHostPorts) + " ports are left");
        }
        Model::VSwitch vswitch;
        vswitch.name = name;
        const auto defaults = VSwitchModel::DefaultPolicy();
        vswitch.policy.teaming = Model::Overlay(defaults.teaming, VSwitchModel::ToModel(teaming));
        VSwitchModel::CheckTeaming(vswitch.policy.teaming, vswitch, "virtual switch " + name);
        // A bridge uses the offloads its ports have: it keeps no capabilities of its own.
        real->Add(name, numPorts,
                  {VSwitchModel::ToPublic(vswitch.policy.teaming),
                   VSwitchModel::ToPublic(Model::Overlay(defaults.security, VSwitchModel::ToModel(security))),
                   VSwitchModel::ToPublic(Model::Overlay(defaults.shaping, VSwitchModel::ToModel(shaping)))});
        return std::make_unique<VirtualSwitchImpl>(name);
    }
    if (Lib::Read<Model::VSwitchesSection>().Find(name))
        throw HostCtlException(refused + "a virtual switch of that name exists");
    if (Lib::Read<Model::DvSwitchesSection>().Find(name))
        throw HostCtlException(refused + "a distributed switch of that name exists");
    if (numPorts < 1 || numPorts > Model::kMaxSwitchPorts) {
        throw HostCtlException(refused + "a virtual switch has 1 to " +
                               std::to_string(Model::kMaxSwitchPorts) + " ports, not " +
                               std::to_string(numPorts));
    }
    std::uint64_t allocated = 0;
    for (const auto& vswitch : Lib::Read<Model::VSwitchesSection>().switches)
        allocated += vswitch.numPorts;
    for (const auto& dvs : Lib::Read<Model::DvSwitchesSection>().switches)
        allocated += dvs.numPorts;
    if (allocated + numPorts > Model::kMaxHostPorts) {
        std::uint64_t left = allocated < Model::kMaxHostPorts ? Model::kMaxHostPorts - allocated : 0;
        throw HostCtlException(refused + std::to_string(numPorts) + " ports requested, but only " +
                               std::to_string(left) + " of the host's " +
                               std::to_string(Model::kMaxHostPorts) + " ports are left");
    }

    Model::VSwitch vswitch;
    vswitch.name = name;
    vswitch.numPorts = numPorts;
    vswitch.configuredPorts = numPorts;
    const auto defaults = VSwitchModel::DefaultPolicy();
    vswitch.policy.teaming = Model::Overlay(defaults.teaming, VSwitchModel::ToModel(teaming));
    VSwitchModel::CheckTeaming(vswitch.policy.teaming, vswitch, "virtual switch " + name);
    vswitch.policy.security = Model::Overlay(defaults.security, VSwitchModel::ToModel(security));
    vswitch.policy.shaping = Model::Overlay(defaults.shaping, VSwitchModel::ToModel(shaping));
    vswitch.capabilities =
        Model::Overlay(VSwitchModel::DefaultCapabilities(), VSwitchModel::ToModel(capabilities));
    Lib::Write<Model::VSwitchesSection>().switches.push_back(std::move(vswitch));
    return std::make_unique<VirtualSwitchImpl>(name);
}

std::unique_ptr<Pub::VirtualSwitch> VirtualSwitchInfoImpl::GetVirtualSwitchByName(const std::string& name) {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::GetVirtualSwitchByName", name);
    if (auto* real = VSwitchModel::RealSwitches())
        return real->Has(name) ? std::make_unique<VirtualSwitchImpl>(name) : nullptr;
    if (!Lib::Read<Model::VSwitchesSection>().Find(name)) return nullptr;
    return std::make_unique<VirtualSwitchImpl>(name);
}

std::vector<std::unique_ptr<Pub::VirtualSwitch>> VirtualSwitchInfoImpl::GetVirtualSwitches() {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::GetVirtualSwitches");
    std::vector<std::unique_ptr<Pub::VirtualSwitch>> switches;
    if (auto* real = VSwitchModel::RealSwitches()) {
        for (const auto& name : real->List())
            switches.push_back(std::make_unique<VirtualSwitchImpl>(name));
        return switches;
    }
    for (const auto& vswitch : Lib::Read<Model::VSwitchesSection>().switches)
        switches.push_back(std::make_unique<VirtualSwitchImpl>(vswitch.name));
    return switches;
}

void VirtualSwitchInfoImpl::RemoveVirtualSwitch(const std::string& name) {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::RemoveVirtualSwitch", name);
    if (auto* real = VSwitchModel::RealSwitches()) return real->Remove(name);
    const auto& current = FindSwitch(name);
    const std::string refused = "Unable to remove virtual switch " + name + ": ";
    for (const auto& nic : Lib::Read<Model::TknNicsSection>().nics) {
        if (nic.connection.type != Model::ConnectionPoint::kPortGroup) continue;
        for (const auto& group : current.portGroups) {
            if (group.name == nic.connection.portGroup) {
                throw HostCtlException(refused + "Tarkon interface " + nic.name +
                                       " is connected to its port group " + group.name);
            }
        }
    }
    for (const auto& lcore : Lib::Read<Model::EnsSection>().lcores) {
        if (lcore.switchName == name)
            throw HostCtlException(refused + "ENS context " + std::to_string(lcore.id) + " serves it");
    }
    const auto& ports = Lib::Read<Model::PortsSection>().ports;
    auto vmPorts = std::count_if(ports.begin(), ports.end(), [&](const Model::Port& port) {
        return port.switchName == name && port.type == Model::kPortVm;
    });
    if (vmPorts)
        throw HostCtlException(refused + std::to_string(vmPorts) + " virtual machine port(s) use it");

    // Its own ports (uplinks, internal ports) go with it.
    std::erase_if(Lib::Write<Model::PortsSection>().ports,
                  [&](const Model::Port& port) { return port.switchName == name; });
    std::erase_if(Lib::Write<Model::VSwitchesSection>().switches,
                  [&](const Model::VSwitch& vswitch) { return vswitch.name == name; });
}

}  // namespace TknCtl::Network

namespace HostCtl::Network {

std::unique_ptr<VirtualSwitch> NetworkFactory::GetVirtualSwitchById(std::string name) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkFactory::GetVirtualSwitchById", name);
    if (auto* real = TknCtl::Network::VSwitchModel::RealSwitches()) {
        if (!real->Has(name)) throw Lib::HostCtlException("Virtual switch " + name + " does not exist");
        return std::make_unique<TknCtl::Network::VirtualSwitchImpl>(name);
    }
    TknCtl::Network::VSwitchModel::FindSwitch(name);
    return std::make_unique<TknCtl::Network::VirtualSwitchImpl>(name);
}

}  // namespace HostCtl::Network

// Port groups of the standard switches: lookup, VLAN and the policies they override.
#include "backend/switches.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/vswitch.h"
#include "model/vswitches.h"
#include "network/vswitch_model.h"

namespace HostCtl::Network {

PortGroup::~PortGroup() = default;

std::unique_ptr<PortGroup> NetworkFactory::GetPortGroupByName(std::string name) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkFactory::GetPortGroupByName", name);
    if (auto* real = TknCtl::Network::VSwitchModel::RealSwitches())
        return real->FindPortGroup(name) ? std::make_unique<TknCtl::Network::PortGroupImpl>(name) : nullptr;
    if (!TknCtl::Lib::Read<TknCtl::Model::VSwitchesSection>().FindPortGroup(name)) return nullptr;
    return std::make_unique<TknCtl::Network::PortGroupImpl>(name);
}

}  // namespace HostCtl::Network

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;
namespace Pub = HostCtl::Network;

namespace {

// The port group and the switch that holds it, after the hook.
struct Located {
    const Model::VSwitch& vswitch;
    const Model::PortGroup& group;
};

Located Enter(const char* operation, const std::string& name, const std::string& arguments = {}) {
    Lib::Enter(std::string("HostCtl::Network::PortGroup::") + operation, name, arguments);
    const auto& section = Lib::Read<Model::VSwitchesSection>();
    const auto* vswitch = section.FindPortGroupSwitch(name);
    if (!vswitch) throw HostCtlException("Port group " + name + " does not exist");
    return {*vswitch, *section.FindPortGroup(name)};
}

Model::PortGroup& Writable(const std::string& name) {
    return *Lib::Write<Model::VSwitchesSection>().FindPortGroup(name);
}

// On a real host: the hook, then the switch area. Nothing on the simulated host.
Backend::Switches* Real(const char* operation, const std::string& name, const std::string& arguments = {}) {
    auto* real = VSwitchModel::RealSwitches();
    if (real) Lib::Enter(std::string("HostCtl::Network::PortGroup::") + operation, name, arguments);
    return real;
}

// The port group on the real host; throws HostCtlException when it has none.
Backend::PortGroupState RealGroup(Backend::Switches& real, const std::string& name) {
    auto group = real.FindPortGroup(name);
    if (!group) throw HostCtlException("Port group " + name + " does not exist");
    return *group;
}

// The port group's switch on the real host, in the model's shape, and the port group in it.
struct RealLocated {
    Model::VSwitch vswitch;
    const Model::PortGroup* group;
};
RealLocated LocateReal(Backend::Switches& real, const std::string& name) {
    RealLocated at{VSwitchModel::RealSwitchModel(real, RealGroup(real, name).vswitch), nullptr};
    for (const auto& group : at.vswitch.portGroups) {
        if (group.name == name) at.group = &group;
    }
    if (!at.group) throw HostCtlException("Port group " + name + " does not exist");
    return at;
}

}  // namespace

PortGroupImpl::PortGroupImpl(std::string name) : name_(std::move(name)) {}
PortGroupImpl::~PortGroupImpl() = default;

std::string PortGroupImpl::GetName() const {
    Lib::Enter("HostCtl::Network::PortGroup::GetName", name_);
    return name_;
}

std::string PortGroupImpl::GetVirtualSwitchName() const {
    if (auto* real = Real("GetVirtualSwitchName", name_)) return RealGroup(*real, name_).vswitch;
    return Enter("GetVirtualSwitchName", name_).vswitch.name;
}

std::unique_ptr<Pub::VirtualSwitch> PortGroupImpl::GetVirtualSwitch() const {
    if (auto* real = Real("GetVirtualSwitch", name_))
        return std::make_unique<VirtualSwitchImpl>(RealGroup(*real, name_).vswitch);
    return std::make_unique<VirtualSwitchImpl>(Enter("GetVirtualSwitch", name_).vswitch.name);
}

std::uint32_t PortGroupImpl::GetActiveClients() const {
    if (auto* real = Real("GetActiveClients", name_)) return RealGroup(*real, name_).activeClients;
    return Enter("GetActiveClients", name_).group.activeClients;
}

std::uint16_t PortGroupImpl::GetVlanId() const {
    if (auto* real = Real("GetVlanId", name_)) return RealGroup(*real, name_).vlanId;
    return Enter("GetVlanId", name_).group.vlanId;
}

void PortGroupImpl::SetVlanId(std::uint16_t vlanId) {
    auto* real = Real("SetVlanId", name_, Lib::Args(vlanId));
    if (real) {
        RealGroup(*real, name_);
    } else {
        Enter("SetVlanId", name_, Lib::Args(vlanId));
    }
    static_assert(MIN_VLAN_ID == 0, "the lower bound is the type's");
    if (vlanId > MAX_VLAN_ID) {
        throw HostCtlException("Unable to set the VLAN ID of port group " + name_ + " to " +
                               std::to_string(vlanId) + ": a VLAN ID is between " +
                               std::to_string(MIN_VLAN_ID) + " and " + std::to_string(MAX_VLAN_ID));
    }
    if (real) return real->SetVlanId(name_, vlanId);
    Writable(name_).vlanId = vlanId;
}

Pub::NicTeamingPolicy PortGroupImpl::GetTeamingPolicy() const {
    if (auto* real = Real("GetTeamingPolicy", name_)) {
        const auto at = LocateReal(*real, name_);
        return VSwitchModel::ToPublic(VSwitchModel::EffectiveTeaming(at.vswitch, *at.group));
    }
    auto at = Enter("GetTeamingPolicy", name_);
    return VSwitchModel::ToPublic(VSwitchModel::EffectiveTeaming(at.vswitch, at.group));
}

Pub::NicTeamingPolicy PortGroupImpl::GetOwnTeamingPolicy() const {
    if (auto* real = Real("GetOwnTeamingPolicy", name_)) return real->ReadPortGroupPolicy(name_).teaming;
    return VSwitchModel::ToPublic(Enter("GetOwnTeamingPolicy", name_).group.policy.teaming);
}

void PortGroupImpl::UpdateTeamingPolicy(const Pub::NicTeamingPolicy& policy) {
    if (auto* real = Real("UpdateTeamingPolicy", name_)) {
        const auto at = LocateReal(*real, name_);
        auto own = VSwitchModel::ToModel(policy);
        VSwitchModel::CheckTeaming(own, at.vswitch, "port group " + name_);
        return real->WritePortGroupTeaming(name_, VSwitchModel::ToPublic(own));
    }
    auto at = Enter("UpdateTeamingPolicy", name_);
    auto own = VSwitchModel::ToModel(policy);
    VSwitchModel::CheckTeaming(own, at.vswitch, "port group " + name_);
    Writable(name_).policy.teaming = std::move(own);
}

Pub::PortSecurityPolicy PortGroupImpl::GetSecurityPolicy() const {
    if (auto* real = Real("GetSecurityPolicy", name_)) {
        const auto at = LocateReal(*real, name_);
        return VSwitchModel::ToPublic(VSwitchModel::EffectiveSecurity(at.vswitch, *at.group));
    }
    auto at = Enter("GetSecurityPolicy", name_);
    return VSwitchModel::ToPublic(VSwitchModel::EffectiveSecurity(at.vswitch, at.group));
}

Pub::PortSecurityPolicy PortGroupImpl::GetOwnSecurityPolicy() const {
    if (auto* real = Real("GetOwnSecurityPolicy", name_)) return real->ReadPortGroupPolicy(name_).security;
    return VSwitchModel::ToPublic(Enter("GetOwnSecurityPolicy", name_).group.policy.security);
}

void PortGroupImpl::UpdateSecurityPolicy(const Pub::PortSecurityPolicy& policy) {
    if (auto* real = Real("UpdateSecurityPolicy", name_)) {
        RealGroup(*real, name_);
        return real->WritePortGroupSecurity(name_, policy);
    }
    Enter("UpdateSecurityPolicy", name_);
    Writable(name_).policy.security = VSwitchModel::ToModel(policy);
}

Pub::ShapingPolicy PortGroupImpl::GetShapingPolicy() const {
    if (auto* real = Real("GetShapingPolicy", name_)) {
        const auto at = LocateReal(*real, name_);
        return VSwitchModel::ToPublic(VSwitchModel::EffectiveShaping(at.vswitch, *at.group));
    }
    auto at = Enter("GetShapingPolicy", name_);
    return VSwitchModel::ToPublic(VSwitchModel::EffectiveShaping(at.vswitch, at.group));
}

Pub::ShapingPolicy PortGroupImpl::GetOwnShapingPolicy() const {
    if (auto* real = Real("GetOwnShapingPolicy", name_)) return real->ReadPortGroupPolicy(name_).shaping;
    return VSwitchModel::ToPublic(Enter("GetOwnShapingPolicy", name_).group.policy.shaping);
}

void PortGroupImpl::UpdateShapingPolicy(const Pub::ShapingPolicy& policy) {
    if (auto* real = Real("UpdateShapingPolicy", name_)) {
        RealGroup(*real, name_);
        return real->WritePortGroupShaping(name_, policy);
    }
    Enter("UpdateShapingPolicy", name_);
    Writable(name_).policy.shaping = VSwitchModel::ToModel(policy);
}

std::vector<std::unique_ptr<Pub::PortGroup>> NetworkInfoImpl::GetAllPortGroups() {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetAllPortGroups");
    std::vector<std::unique_ptr<Pub::PortGroup>> groups;
    if (auto* real = VSwitchModel::RealSwitches()) {
        for (const auto& group : real->PortGroups())
            groups.push_back(std::make_unique<PortGroupImpl>(group.name));
        return groups;
    }
    for (const auto& vswitch : Lib::Read<Model::VSwitchesSection>().switches) {
        for (const auto& group : vswitch.portGroups)
            groups.push_back(std::make_unique<PortGroupImpl>(group.name));
    }
    return groups;
}

}  // namespace TknCtl::Network

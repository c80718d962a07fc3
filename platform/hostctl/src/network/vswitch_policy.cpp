// Network policies of standard switches and port groups: the host's defaults, conversions
// between the model and the public value types, effective policies and their checks.
#include <algorithm>
#include <set>

#include "backend/host.h"
#include "backend/switches.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "network/vswitch_model.h"

namespace HostCtl::Network {

NicTeamingPolicy NicTeamingPolicy::GetDefaultPolicy() {
    TknCtl::Lib::Enter("HostCtl::Network::NicTeamingPolicy::GetDefaultPolicy");
    return TknCtl::Network::VSwitchModel::ToPublic(TknCtl::Network::VSwitchModel::DefaultPolicy().teaming);
}

PortSecurityPolicy PortSecurityPolicy::GetDefaultPolicy() {
    TknCtl::Lib::Enter("HostCtl::Network::PortSecurityPolicy::GetDefaultPolicy");
    return TknCtl::Network::VSwitchModel::ToPublic(TknCtl::Network::VSwitchModel::DefaultPolicy().security);
}

ShapingPolicy ShapingPolicy::GetDefaultPolicy() {
    TknCtl::Lib::Enter("HostCtl::Network::ShapingPolicy::GetDefaultPolicy");
    return TknCtl::Network::VSwitchModel::ToPublic(TknCtl::Network::VSwitchModel::DefaultPolicy().shaping);
}

NicCapabilities NicCapabilities::GetDefaultPolicy() {
    TknCtl::Lib::Enter("HostCtl::Network::NicCapabilities::GetDefaultPolicy");
    return TknCtl::Network::VSwitchModel::ToPublic(TknCtl::Network::VSwitchModel::DefaultCapabilities());
}

}  // namespace HostCtl::Network

namespace TknCtl::Network::VSwitchModel {

using HostCtl::Lib::HostCtlException;
namespace Pub = HostCtl::Network;

Model::Policy DefaultPolicy() {
    Model::Policy p;
    p.teaming.policy = Pub::NicTeamingPolicy::TEAM_PORTID;
    p.teaming.notifySwitches = true;
    p.teaming.rollingRestoration = false;
    p.teaming.linkCriteria = Model::LinkCriteria{true};
    p.security.allowPromiscuous = false;
    p.security.allowMacChange = false;
    p.security.allowForgedTransmits = false;
    p.shaping.enabled = false;
    p.shaping.averageBps = 100000000;  // 100000 Kbps
    p.shaping.peakBps = 100000000;
    p.shaping.burstSize = 104857600;  // 819200 Kib
    return p;
}

Model::Capabilities DefaultCapabilities() {
    return {true, true, true};
}

// ---------------------------------------------------------------- conversions

Pub::NicTeamingPolicy ToPublic(const Model::TeamingPolicy& m) {
    Pub::NicTeamingPolicy p;
    if (m.policy) p.SetTeamingPolicy(static_cast<Pub::NicTeamingPolicy::TeamPolicyType>(*m.policy));
    if (m.notifySwitches) p.SetNotifySwitchOnFailure(*m.notifySwitches);
    if (m.rollingRestoration) p.SetRollingRestoration(*m.rollingRestoration);
    if (m.linkCriteria) {
        Pub::LinkCriteriaSelectionPolicy criteria;
        if (m.linkCriteria->beacon) criteria.SetBeacon(*m.linkCriteria->beacon);
        p.SetLinkCriteria(criteria);
    }
    if (m.uplinkOrder) p.SetUplinkOrder(*m.uplinkOrder);
    if (m.maxActive) p.SetMaxActiveUplinks(*m.maxActive);
    return p;
}

Pub::PortSecurityPolicy ToPublic(const Model::SecurityPolicy& m) {
    Pub::PortSecurityPolicy p;
    if (m.allowPromiscuous) p.SetAllowPromiscuous(*m.allowPromiscuous);
    if (m.allowMacChange) p.SetAllowMacAddressChange(*m.allowMacChange);
    if (m.allowForgedTransmits) p.SetAllowForgedTransmits(*m.allowForgedTransmits);
    return p;
}

Pub::ShapingPolicy ToPublic(const Model::ShapingPolicy& m) {
    Pub::ShapingPolicy p;
    if (m.enabled) p.SetEnabled(*m.enabled);
    if (m.averageBps) p.SetAverageBps(*m.averageBps);
    if (m.peakBps) p.SetPeakBps(*m.peakBps);
    if (m.burstSize) p.SetBurstSize(*m.burstSize);
    return p;
}

Pub::NicCapabilities ToPublic(const Model::Capabilities& m) {
    Pub::NicCapabilities p;
    if (m.csumOffload) p.SetCsumOffload(*m.csumOffload);
    if (m.tcpSegmentation) p.SetTcpSegmentation(*m.tcpSegmentation);
    if (m.zeroCopyXmit) p.SetZeroCopyXmit(*m.zeroCopyXmit);
    return p;
}

namespace {
template <class T>
std::optional<T> IfSet(bool set, T value) {
    return set ? std::optional<T>(std::move(value)) : std::nullopt;
}
}  // namespace

Model::TeamingPolicy ToModel(const Pub::NicTeamingPolicy& p) {
    Model::TeamingPolicy m;
    m.policy = IfSet<std::uint32_t>(p.IsTeamingPolicySet(), static_cast<std::uint32_t>(p.GetTeamingPolicy()));
    m.notifySwitches = IfSet(p.IsNotifySwitchOnFailureSet(), p.GetNotifySwitchOnFailure());
    m.rollingRestoration = IfSet(p.IsRollingRestorationSet(), p.GetRollingRestoration());
    if (p.IsLinkCriteriaSet()) {
        const auto& criteria = p.GetLinkCriteria();
        m.linkCriteria = Model::LinkCriteria{IfSet(criteria.IsBeaconSet(), criteria.GetBeacon())};
    }
    m.uplinkOrder = IfSet(p.IsUplinkOrderSet(), p.GetUplinkOrder());
    m.maxActive = IfSet<std::int32_t>(p.IsMaxActiveUplinksSet(), p.GetMaxActiveUplinks());
    return m;
}

Model::SecurityPolicy ToModel(const Pub::PortSecurityPolicy& p) {
    Model::SecurityPolicy m;
    m.allowPromiscuous = IfSet(p.IsAllowPromiscuousSet(), p.GetAllowPromiscuous());
    m.allowMacChange = IfSet(p.IsAllowMacAddressChangeSet(), p.GetAllowMacAddressChange());
    m.allowForgedTransmits = IfSet(p.IsAllowForgedTransmitsSet(), p.GetAllowForgedTransmits());
    return m;
}

Model::ShapingPolicy ToModel(const Pub::ShapingPolicy& p) {
    Model::ShapingPolicy m;
    m.enabled = IfSet(p.IsEnabledSet(), p.IsEnabled());
    m.averageBps = IfSet(p.IsAverageBpsSet(), p.GetAverageBps());
    m.peakBps = IfSet(p.IsPeakBpsSet(), p.GetPeakBps());
    m.burstSize = IfSet(p.IsBurstSizeSet(), p.GetBurstSize());
    return m;
}

Model::Capabilities ToModel(const Pub::NicCapabilities& p) {
    Model::Capabilities m;
    m.csumOffload = IfSet(p.IsCsumOffloadSet(), p.GetCsumOffload());
    m.tcpSegmentation = IfSet(p.IsTcpSegmentationSet(), p.GetTcpSegmentation());
    m.zeroCopyXmit = IfSet(p.IsZeroCopyXmitSet(), p.GetZeroCopyXmit());
    return m;
}

// ---------------------------------------------------------------- effective policies

Model::TeamingPolicy EffectiveTeaming(const Model::VSwitch& vswitch) {
    Model::TeamingPolicy teaming = vswitch.policy.teaming;
    if (!teaming.uplinkOrder) teaming.uplinkOrder = vswitch.uplinks;
    if (!teaming.maxActive) teaming.maxActive = static_cast<std::int32_t>(teaming.uplinkOrder->size());
    return teaming;
}

Model::TeamingPolicy EffectiveTeaming(const Model::VSwitch& vswitch, const Model::PortGroup& group) {
    return Model::Overlay(EffectiveTeaming(vswitch), group.policy.teaming);
}

Model::SecurityPolicy EffectiveSecurity(const Model::VSwitch& vswitch, const Model::PortGroup& group) {
    return Model::Overlay(vswitch.policy.security, group.policy.security);
}

Model::ShapingPolicy EffectiveShaping(const Model::VSwitch& vswitch, const Model::PortGroup& group) {
    return Model::Overlay(vswitch.policy.shaping, group.policy.shaping);
}

// ---------------------------------------------------------------- checks and edits

void CheckTeaming(const Model::TeamingPolicy& policy, const Model::VSwitch& vswitch,
                  const std::string& owner) {
    if (policy.policy && (*policy.policy < Pub::NicTeamingPolicy::TEAM_IPHASH ||
                          *policy.policy > Pub::NicTeamingPolicy::TEAM_EXPLICIT)) {
        throw HostCtlException("Unable to update the teaming policy of " + owner +
                               ": unknown teaming policy type " + std::to_string(*policy.policy));
    }
    if (policy.uplinkOrder) {
        std::set<std::string> seen;
        for (const auto& uplink : *policy.uplinkOrder) {
            if (std::find(vswitch.uplinks.begin(), vswitch.uplinks.end(), uplink) == vswitch.uplinks.end()) {
                throw HostCtlException("Unable to update the teaming policy of " + owner + ": " + uplink +
                                       " is not an uplink of virtual switch " + vswitch.name);
            }
            if (!seen.insert(uplink).second) {
                throw HostCtlException("Unable to update the teaming policy of " + owner + ": uplink " +
                                       uplink + " appears more than once in the failover order");
            }
        }
    }
    if (policy.maxActive && *policy.maxActive < 0) {
        throw HostCtlException("Unable to update the teaming policy of " + owner +
                               ": the number of active uplinks cannot be negative");
    }
}

void DropFromOrder(Model::TeamingPolicy& policy, const std::string& uplink) {
    if (!policy.uplinkOrder) return;
    auto& order = *policy.uplinkOrder;
    auto found = std::find(order.begin(), order.end(), uplink);
    if (found == order.end()) return;
    if (policy.maxActive && found - order.begin() < *policy.maxActive) --*policy.maxActive;
    order.erase(found);
}

const Model::VSwitch& FindSwitch(const std::string& name) {
    const auto* vswitch = Lib::Read<Model::VSwitchesSection>().Find(name);
    if (!vswitch) throw HostCtlException("Virtual switch " + name + " does not exist");
    return *vswitch;
}

Backend::Switches* RealSwitches() {
    auto* host = Lib::RealHost();
    return host ? &host->GetSwitches() : nullptr;
}

Model::VSwitch RealSwitchModel(Backend::Switches& switches, const std::string& name) {
    const auto state = switches.Read(name);
    const auto stored = switches.ReadPolicy(name);
    Model::VSwitch vswitch;
    vswitch.name = name;
    vswitch.uplinks = state.uplinks;
    vswitch.policy = {ToModel(stored.teaming), ToModel(stored.security), ToModel(stored.shaping)};
    for (const auto& groupName : state.portGroups) {
        const auto own = switches.ReadPortGroupPolicy(groupName);
        Model::PortGroup group;
        group.name = groupName;
        group.policy = {ToModel(own.teaming), ToModel(own.security), ToModel(own.shaping)};
        vswitch.portGroups.push_back(std::move(group));
    }
    return vswitch;
}

}  // namespace TknCtl::Network::VSwitchModel

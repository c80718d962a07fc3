// VLAN statistics of switch uplinks: counted per VLAN while their collection is on.
#include <algorithm>

#include "backend/nics.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "model/dvswitches.h"
#include "model/pnics.h"
#include "model/vswitches.h"
#include "network/internal.h"

namespace TknCtl::Network::Internal {

namespace {
// The uplink's NIC, after checking that the switch uses it.
const Model::Pnic& Uplink(const std::string& switchName, const std::string& uplink) {
    std::vector<std::string> uplinks;
    if (const auto* vswitch = Lib::Read<Model::VSwitchesSection>().Find(switchName)) {
        uplinks = vswitch->uplinks;
    } else if (const auto* dvs = Lib::Read<Model::DvSwitchesSection>().Find(switchName)) {
        uplinks = dvs->uplinks;
    } else {
        throw HostCtl::Lib::HostCtlException("Switch " + switchName + " does not exist");
    }
    if (std::find(uplinks.begin(), uplinks.end(), uplink) == uplinks.end()) {
        throw HostCtl::Lib::HostCtlException("Switch " + switchName + " has no uplink " + uplink);
    }
    const auto* nic = Lib::Read<Model::PnicsSection>().Find(uplink);
    if (!nic) throw HostCtl::Lib::HostCtlException("Uplink " + uplink + " is not a physical NIC");
    return *nic;
}
}  // namespace

std::vector<HostCtl::Network::VlanStats> UplinkVlanStats(const std::string& switchName,
                                                         const std::string& uplink) {
    if (auto* host = Lib::RealHost()) return host->GetNics().GetUplinkVlanStats(switchName, uplink);
    const auto& nic = Uplink(switchName, uplink);
    std::vector<HostCtl::Network::VlanStats> stats;
    if (!nic.vlanStatsEnabled) return stats;
    for (const auto& vlan : nic.vlanStats)
        stats.push_back({vlan.vlanId, vlan.rxPackets, vlan.txPackets});
    return stats;
}

void SetUplinkVlanStatsEnabled(const std::string& switchName, const std::string& uplink, bool enabled) {
    if (auto* host = Lib::RealHost())
        return host->GetNics().SetUplinkVlanStatsEnabled(switchName, uplink, enabled);
    Uplink(switchName, uplink);
    // The VLANs the switch's port groups carry are counted from the moment collection starts
    // (4095 stands for all VLANs, not for one). Counters gathered before are kept.
    std::vector<std::uint32_t> active;
    if (const auto* vswitch = Lib::Read<Model::VSwitchesSection>().Find(switchName)) {
        for (const auto& group : vswitch->portGroups) {
            if (group.vlanId != Model::kMaxVlanId) active.push_back(group.vlanId);
        }
    }
    auto& nic = *Lib::Write<Model::PnicsSection>().Find(uplink);
    nic.vlanStatsEnabled = enabled;
    if (!enabled) return;
    for (auto vlanId : active) {
        const bool counted =
            std::any_of(nic.vlanStats.begin(), nic.vlanStats.end(),
                        [&](const Model::VlanStats& entry) { return entry.vlanId == vlanId; });
        if (!counted) nic.vlanStats.push_back({vlanId, 0, 0});
    }
    std::sort(nic.vlanStats.begin(), nic.vlanStats.end(),
              [](const Model::VlanStats& a, const Model::VlanStats& b) { return a.vlanId < b.vlanId; });
}

}  // namespace TknCtl::Network::Internal

// VLAN statistics of switch uplinks.
#include <algorithm>

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

std::vector<HostCtl::Network::VlanStats> UplinkVlanStats(const std::string& switchName, const std::string& uplink) {
    const auto& nic = Uplink(switchName, uplink);
    std::vector<HostCtl::Network::VlanStats> stats;
    if (!nic.vlanStatsEnabled) return stats;
    for (const auto& vlan : nic.vlanStats) stats.push_back({vlan.vlanId, vlan.rxPackets, vlan.txPackets});
    return stats;
}

void SetUplinkVlanStatsEnabled(const std::string& switchName, const std::string& uplink, bool enabled) {
    Uplink(switchName, uplink);
    Lib::Write<Model::PnicsSection>().Find(uplink)->vlanStatsEnabled = enabled;
}

}  // namespace TknCtl::Network::Internal

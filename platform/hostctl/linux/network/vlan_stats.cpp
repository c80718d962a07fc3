// VLAN counters of switch uplinks on the Linux host: a switch is a bridge and its uplinks are
// NICs that are its ports. The bridge counts per VLAN and port while its vlan_stats_enabled
// option is on; the option exists only where the kernel has bridge VLAN filtering.
#include "kernel/vlan_stats.h"
#include "hostctl/exception.h"
#include "kernel/sysfs.h"
#include "network/pnic.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;

namespace {

// The bridge of a switch and its uplink port, after checking that the switch has that uplink.
std::pair<Kernel::Link, Kernel::Link> SwitchUplink(const Kernel::Namespace& ns, const std::string& switchName,
                                                   const Kernel::Link& uplink) {
    auto bridge = switchName.empty() || switchName.find('/') != std::string::npos
                      ? std::nullopt
                      : Kernel::FindLink(ns, switchName);
    if (!bridge || bridge->kind != "bridge")
        throw HostCtlException("Switch " + switchName + " does not exist");
    if (uplink.master != bridge->index)
        throw HostCtlException("Switch " + switchName + " has no uplink " + uplink.name);
    return {*bridge, uplink};
}

}  // namespace

std::vector<HostCtl::Network::VlanStats> LinuxNics::GetUplinkVlanStats(const std::string& switchName,
                                                                       const std::string& uplink) {
    const auto [bridge, port] = SwitchUplink(Own(), switchName, Require(uplink));
    std::vector<HostCtl::Network::VlanStats> stats;
    // A kernel without bridge VLAN filtering counts nothing per VLAN: the counters are off.
    const auto enabled = Kernel::BridgeVlanStatsEnabled(sysfs_, bridge.name);
    if (!enabled || !*enabled) return stats;
    try {
        for (const auto& vlan : Kernel::ReadPortVlanStats(Own(), port.index))
            stats.push_back({vlan.vlanId, vlan.rxPackets, vlan.txPackets});
    } catch (const Kernel::EthtoolRefusal& refusal) {
        Refuse("Cannot read the VLAN counters of " + uplink, refusal);
    }
    return stats;
}

void LinuxNics::SetUplinkVlanStatsEnabled(const std::string& switchName, const std::string& uplink,
                                          bool enabled) {
    const auto [bridge, port] = SwitchUplink(Own(), switchName, Require(uplink));
    const auto current = Kernel::BridgeVlanStatsEnabled(sysfs_, bridge.name);
    if (!current) {
        throw HostCtlException("VLAN statistics of " + uplink +
                               " are not available: they need bridge VLAN filtering, which this kernel does "
                               "not have (CONFIG_BRIDGE_VLAN_FILTERING)");
    }
    if (*current == enabled) return;
    context_.RequireUndoable("the VLAN counters setting of a bridge");
    context_.BeginChange();
    try {
        Kernel::ChangeBridgeVlanStats(Own(), bridge.index, enabled);
    } catch (const Kernel::EthtoolRefusal& refusal) {
        Refuse("Cannot turn " + std::string(enabled ? "on" : "off") + " the VLAN counters of switch " +
                   switchName,
               refusal);
    }
    if (!Kernel::DryRun() && Kernel::BridgeVlanStatsEnabled(sysfs_, bridge.name) != enabled) {
        throw HostCtlException("The VLAN counters of switch " + switchName + " are still " +
                               (enabled ? "off" : "on") + " after they were turned " +
                               (enabled ? "on" : "off"));
    }
}

}  // namespace TknCtl::Linux

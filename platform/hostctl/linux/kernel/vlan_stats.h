// Per-VLAN counters of bridge ports, and their collection (the bridge's vlan_stats_enabled and
// vlan_stats_per_port options). Both need bridge VLAN filtering in the kernel.
#pragma once

#include <cstdint>
#include <vector>

#include "kernel/netlink.h"

struct nl_msg;

namespace TknCtl::Linux::Kernel {

struct VlanCounters {
    std::uint16_t vlanId = 0;
    std::uint64_t rxPackets = 0, txPackets = 0;
};

// RTM_GETSTATS for the bridge counters of a port (IFLA_STATS_LINK_XSTATS_SLAVE).
nl_msg* BuildPortVlanStatsRequest(int portIndex);
// The VLAN entries of its reply (BRIDGE_XSTATS_VLAN), in the kernel's order.
std::vector<VlanCounters> ParsePortVlanStats(nl_msg* reply);
// RTM_NEWLINK on a bridge turning its per-VLAN counters on (per port) or off.
nl_msg* BuildBridgeVlanStatsChange(int bridgeIndex, bool enabled);

// The same, carried out inside a namespace; a refusal throws EthtoolRefusal with the kernel's
// words.
std::vector<VlanCounters> ReadPortVlanStats(const Namespace& ns, int portIndex);
void ChangeBridgeVlanStats(const Namespace& ns, int bridgeIndex, bool enabled);

}  // namespace TknCtl::Linux::Kernel

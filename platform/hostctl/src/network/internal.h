// Shared pieces of the network operations.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "hostctl/network/portset.h"

namespace TknCtl::Network::Internal {

// The standard switch of that name as a Portset (the switch need not exist yet; its
// operations throw when it does not).
std::unique_ptr<HostCtl::Network::Portset> MakeStandardPortset(const std::string& name);

// The ports of one switch (standard or distributed), in the host's order.
std::vector<std::unique_ptr<HostCtl::Network::Port>> PortsOfSwitch(const std::string& switchName);

// VLAN statistics of an uplink of a switch; empty while their collection is off.
std::vector<HostCtl::Network::VlanStats> UplinkVlanStats(const std::string& switchName, const std::string& uplink);
void SetUplinkVlanStatsEnabled(const std::string& switchName, const std::string& uplink, bool enabled);

// The text of a CDP status code ("down", "listen", "advertise", "both").
std::string CdpStatusText(std::uint32_t code);

}  // namespace TknCtl::Network::Internal

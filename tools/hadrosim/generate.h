// A large but consistent host, for measuring how the programs cope with size.
#pragma once

#include <string>

namespace Hadro::Sim {

// The smallest and largest scale the generator accepts.
constexpr double kMinScale = 0.01;
constexpr double kMaxScale = 16;

// The state document of a host built on the default host. At scale 1 it holds 256 Tarkon
// interfaces, 64 more standard switches with 1,024 port groups, 16 more distributed
// switches with 4,096 ports, 1,000 VM worlds, 200 more firewall rulesets with 2,000 rules,
// 10,000 connections, 5,000 neighbours and 2,000 routes; every count grows in proportion to
// scale, except where the host's own limits stop it: at most 256 Tarkon interfaces
// (tkn0 to tkn255) and 4,608 switch ports on the host (switches beyond that share the ports
// that are left, and VMs beyond the distributed ports have no port). Everything it refers
// to exists, names and addresses are unique, and the same scale always gives the same
// document.
std::string GenerateHost(double scale);

}  // namespace Hadro::Sim

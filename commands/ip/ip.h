// The command classes of the host's IP services: routes, DNS, neighbours, connections, global
// IP settings and multicast groups; and of its netstack instances and IPsec.
#pragma once

#include "frame/command.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

// The factories of the two groups (registry_services.cpp, registry_stacks.cpp).
const FactoryList& IpServiceFactories();
const FactoryList& IpStackFactories();

}  // namespace TalvexCli::NetworkNamespace

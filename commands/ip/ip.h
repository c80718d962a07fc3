// The command classes of host IP services: routes, DNS, neighbours, connections, global IP settings,
// multicast groups, netstacks, IPsec.
#pragma once

#include "frame/command.h"

namespace TalvexCli::NetworkNamespace {}  // namespace TalvexCli::NetworkNamespace

// The command classes of distributed switches, LACP, ports and VMs.
#pragma once

#include "frame/command.h"

namespace TalvexCli::NetworkNamespace {}  // namespace TalvexCli::NetworkNamespace

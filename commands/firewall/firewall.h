// The command classes of the host firewall.
#pragma once

#include "frame/command.h"

namespace TalvexCli::NetworkNamespace {}  // namespace TalvexCli::NetworkNamespace

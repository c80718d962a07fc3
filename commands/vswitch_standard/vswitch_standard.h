// The command classes of standard virtual switches, uplinks, port groups and their policies.
#pragma once

#include "frame/command.h"

namespace TalvexCli::NetworkNamespace {}  // namespace TalvexCli::NetworkNamespace

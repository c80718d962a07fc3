// The command classes of ENS contexts.
#pragma once

#include "frame/command.h"

namespace TalvexCli::NetworkNamespace {}  // namespace TalvexCli::NetworkNamespace

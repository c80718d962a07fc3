// The command classes of physical NICs and SR-IOV.
#pragma once

#include "frame/command.h"

namespace TalvexCli::NetworkNamespace {}  // namespace TalvexCli::NetworkNamespace

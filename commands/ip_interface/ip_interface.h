// The command classes of Tarkon network interfaces: "network ip interface ...".
#pragma once

#include "frame/command.h"

namespace TalvexCli::NetworkNamespace {}  // namespace TalvexCli::NetworkNamespace

// The host's IP services inside the library: what a change of an interface means for the
// routes of its netstack.
#pragma once

#include <string>

namespace TknCtl::Network::Internal {

// Keeps the gateway routes of a netstack consistent with its interfaces: a route whose gateway
// its interface no longer reaches moves to an interface that does, or goes; the default route
// of the configured default gateway comes back once an interface reaches the gateway.
void SyncGatewayRoutes(const std::string& netstack);

}  // namespace TknCtl::Network::Internal

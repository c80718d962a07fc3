#include "commands/ip/ip.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

// The IP commands come in two groups: the host's IP services (routes, DNS, neighbours,
// connections, global settings, multicast) and its netstack instances and IPsec.
const FactoryList& IpFactories() {
    static const FactoryList factories = [] {
        FactoryList all = IpServiceFactories();
        const FactoryList& stacks = IpStackFactories();
        all.insert(all.end(), stacks.begin(), stacks.end());
        return all;
    }();
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

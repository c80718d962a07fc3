#include "commands/firewall/firewall.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& FirewallFactories() {
    static const FactoryList factories{};
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

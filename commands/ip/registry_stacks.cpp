#include "commands/ip/ip.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& IpStackFactories() {
    static const FactoryList factories{};
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

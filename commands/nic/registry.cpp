#include "commands/nic/nic.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& NicFactories() {
    static const FactoryList factories{};
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

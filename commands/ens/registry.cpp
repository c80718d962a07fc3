#include "commands/ens/ens.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& EnsFactories() {
    static const FactoryList factories{};
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/dvs/dvs.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& DvsFactories() {
    static const FactoryList factories{};
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

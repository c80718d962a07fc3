#include "commands/vswitch_standard/vswitch_standard.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& VswitchStandardFactories() {
    static const FactoryList factories{};
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

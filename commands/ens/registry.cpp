#include "commands/ens/ens.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& EnsFactories() {
    static const FactoryList factories{
        NETWORK_FACTORY(EnsMaxlcoresGet),     NETWORK_FACTORY(EnsMaxlcoresSet),
        NETWORK_FACTORY(EnsLcoreAdd),         NETWORK_FACTORY(EnsLcoreRemove),
        NETWORK_FACTORY(EnsLcoreList),        NETWORK_FACTORY(EnsLcoreSwitchGet),
        NETWORK_FACTORY(EnsLcoreSwitchAdd),   NETWORK_FACTORY(EnsLcoreSwitchRemove),
        NETWORK_FACTORY(EnsLcoreAffinityGet), NETWORK_FACTORY(EnsLcoreAffinitySet),
    };
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

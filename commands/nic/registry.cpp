#include "commands/nic/nic.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& NicFactories() {
    static const FactoryList factories{
        NETWORK_FACTORY(NicList),
        NETWORK_FACTORY(NicGet),
        NETWORK_FACTORY(NicSet),
        NETWORK_FACTORY(NicUp),
        NETWORK_FACTORY(NicDown),
        NETWORK_FACTORY(NicCoalesceGet),
        NETWORK_FACTORY(NicCoalesceSet),
        NETWORK_FACTORY(NicCoalesceLowGet),
        NETWORK_FACTORY(NicCoalesceLowSet),
        NETWORK_FACTORY(NicCoalesceHighGet),
        NETWORK_FACTORY(NicCoalesceHighSet),
        NETWORK_FACTORY(NicCsoGet),
        NETWORK_FACTORY(NicCsoSet),
        NETWORK_FACTORY(NicTsoGet),
        NETWORK_FACTORY(NicTsoSet),
        NETWORK_FACTORY(NicSgGet),
        NETWORK_FACTORY(NicSgSet),
        NETWORK_FACTORY(NicPauseParamsList),
        NETWORK_FACTORY(NicPauseParamsSet),
        NETWORK_FACTORY(NicRingPresetGet),
        NETWORK_FACTORY(NicRingCurrentGet),
        NETWORK_FACTORY(NicRingCurrentSet),
        NETWORK_FACTORY(NicSoftwareList),
        NETWORK_FACTORY(NicSoftwareSet),
    };
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

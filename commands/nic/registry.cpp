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
        NETWORK_FACTORY(NicStatsGet),
        NETWORK_FACTORY(NicVlanStatsGet),
        NETWORK_FACTORY(NicVlanStatsSet),
        NETWORK_FACTORY(NicRegisterDump),
        NETWORK_FACTORY(NicEepromDump),
        NETWORK_FACTORY(NicEepromChange),
        NETWORK_FACTORY(NicSelfTestRun),
        NETWORK_FACTORY(NicNegotiationRestart),
        NETWORK_FACTORY(NicQueueLbSettingList),
        NETWORK_FACTORY(NicQueueLbSettingSet),
        NETWORK_FACTORY(NicQueueLbStateList),
        NETWORK_FACTORY(NicQueueLbStateSet),
        NETWORK_FACTORY(NicQueueLbPluginList),
        NETWORK_FACTORY(NicQueueLbPluginSet),
        NETWORK_FACTORY(NicQueueCountGet),
        NETWORK_FACTORY(NicQueueCountSet),
        NETWORK_FACTORY(NicQueueFilterClassList),
        NETWORK_FACTORY(SriovNicList),
        NETWORK_FACTORY(VfList),
        NETWORK_FACTORY(VfStats),
    };
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

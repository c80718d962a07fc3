#include "commands/dvs/dvs.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& DvsFactories() {
    static const FactoryList factories{
        NETWORK_FACTORY(VirtualSwitchDVSTalvexList),
        NETWORK_FACTORY(LacpGetConfig),
        NETWORK_FACTORY(LacpGetStatus),
        NETWORK_FACTORY(LacpGetStats),
        NETWORK_FACTORY(LacpSetTimeout),
        NETWORK_FACTORY(PortStatsGet),
        NETWORK_FACTORY(PortFilterStatsGet),
        NETWORK_FACTORY(VMList),
        NETWORK_FACTORY(VMPortList),
    };
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

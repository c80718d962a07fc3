#include "commands/ip/ip.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& IpStackFactories() {
    static const FactoryList factories{
        NETWORK_FACTORY(IpNetstackInstanceAdd),
        NETWORK_FACTORY(IpNetstackInstanceList),
        NETWORK_FACTORY(IpNetstackInstanceGet),
        NETWORK_FACTORY(IpNetstackInstanceSet),
        NETWORK_FACTORY(IpNetstackInstanceRemove),
        NETWORK_FACTORY(IpIpsecSAAdd),
        NETWORK_FACTORY(IpIpsecSAList),
        NETWORK_FACTORY(IpIpsecSARemove),
        NETWORK_FACTORY(IpIpsecSPAdd),
        NETWORK_FACTORY(IpIpsecSPList),
        NETWORK_FACTORY(IpIpsecSPRemove),
    };
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

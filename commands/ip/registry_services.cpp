#include "commands/ip/ip.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& IpServiceFactories() {
    static const FactoryList factories{
        NETWORK_FACTORY(IpRouteIpv4Add),
        NETWORK_FACTORY(IpRouteIpv4List),
        NETWORK_FACTORY(IpRouteIpv4Remove),
        NETWORK_FACTORY(IpRouteIpv6Add),
        NETWORK_FACTORY(IpRouteIpv6List),
        NETWORK_FACTORY(IpRouteIpv6Remove),
        NETWORK_FACTORY(IpDNSServerList),
        NETWORK_FACTORY(IpDNSServerAdd),
        NETWORK_FACTORY(IpDNSServerRemove),
        NETWORK_FACTORY(IpDNSSearchList),
        NETWORK_FACTORY(IpDNSSearchAdd),
        NETWORK_FACTORY(IpDNSSearchRemove),
        NETWORK_FACTORY(IpNeighborList),
        NETWORK_FACTORY(IpNeighborRemove),
        NETWORK_FACTORY(IpConnectionList),
        NETWORK_FACTORY(IpGet),
        NETWORK_FACTORY(IpSet),
        NETWORK_FACTORY(MulticastGroupList),
    };
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

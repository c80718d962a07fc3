#include "commands/ip_interface/ip_interface.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& IpInterfaceFactories() {
    static const FactoryList factories{
        NETWORK_FACTORY(IpInterfaceList),
        NETWORK_FACTORY(IpInterfaceAdd),
        NETWORK_FACTORY(IpInterfaceRemove),
        NETWORK_FACTORY(IpInterfaceSet),
        NETWORK_FACTORY(IpInterfaceIpv4Get),
        NETWORK_FACTORY(IpInterfaceIpv4Set),
        NETWORK_FACTORY(IpInterfaceIpv6Get),
        NETWORK_FACTORY(IpInterfaceIpv6Set),
        NETWORK_FACTORY(IpInterfaceIpv6AddressList),
        NETWORK_FACTORY(IpInterfaceIpv6AddressAdd),
        NETWORK_FACTORY(IpInterfaceIpv6AddressRemove),
        NETWORK_FACTORY(IpInterfaceTagAdd),
        NETWORK_FACTORY(IpInterfaceTagGet),
        NETWORK_FACTORY(IpInterfaceTagRemove),
    };
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

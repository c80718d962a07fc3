#include "commands/ip_interface/ip_interface.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& IpInterfaceFactories() {
    static const FactoryList factories{};
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

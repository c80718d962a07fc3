#include "commands/firewall/firewall.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& FirewallFactories() {
    static const FactoryList factories{
        NETWORK_FACTORY(FirewallGet),
        NETWORK_FACTORY(FirewallSet),
        NETWORK_FACTORY(FirewallLoad),
        NETWORK_FACTORY(FirewallRefresh),
        NETWORK_FACTORY(FirewallUnload),
        NETWORK_FACTORY(FirewallRulesetList),
        NETWORK_FACTORY(FirewallRulesetSet),
        NETWORK_FACTORY(FirewallRulesetRuleList),
        NETWORK_FACTORY(FirewallRulesetAllowedipList),
        NETWORK_FACTORY(FirewallRulesetAllowedipAdd),
        NETWORK_FACTORY(FirewallRulesetAllowedipRemove),
        NETWORK_FACTORY(FirewallRulesetClientGet),
        NETWORK_FACTORY(FirewallRulesetClientAdd),
        NETWORK_FACTORY(FirewallRulesetClientRemove),
    };
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

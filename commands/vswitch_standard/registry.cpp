#include "commands/vswitch_standard/vswitch_standard.h"
#include "frame/factories.h"

namespace TalvexCli::NetworkNamespace {

const FactoryList& VswitchStandardFactories() {
    static const FactoryList factories{
        NETWORK_FACTORY(VirtualSwitchStandardAdd),
        NETWORK_FACTORY(VirtualSwitchStandardList),
        NETWORK_FACTORY(VirtualSwitchStandardRemove),
        NETWORK_FACTORY(VirtualSwitchStandardSet),
        NETWORK_FACTORY(VirtualSwitchStandardUplinkAdd),
        NETWORK_FACTORY(VirtualSwitchStandardUplinkRemove),
        NETWORK_FACTORY(VirtualSwitchStandardPolicyFailoverGet),
        NETWORK_FACTORY(VirtualSwitchStandardPolicyFailoverSet),
        NETWORK_FACTORY(VirtualSwitchStandardPolicySecurityGet),
        NETWORK_FACTORY(VirtualSwitchStandardPolicySecuritySet),
        NETWORK_FACTORY(VirtualSwitchStandardPolicyShapingGet),
        NETWORK_FACTORY(VirtualSwitchStandardPolicyShapingSet),
        NETWORK_FACTORY(VirtualSwitchPortGroupPolicyFailoverGet),
        NETWORK_FACTORY(VirtualSwitchPortGroupPolicyFailoverSet),
        NETWORK_FACTORY(VirtualSwitchPortGroupPolicySecurityGet),
        NETWORK_FACTORY(VirtualSwitchPortGroupPolicySecuritySet),
        NETWORK_FACTORY(VirtualSwitchPortGroupPolicyShapingGet),
        NETWORK_FACTORY(VirtualSwitchPortGroupPolicyShapingSet),
        NETWORK_FACTORY(VirtualSwitchPortGroupList),
        NETWORK_FACTORY(VirtualSwitchPortGroupAdd),
        NETWORK_FACTORY(VirtualSwitchPortGroupRemove),
        NETWORK_FACTORY(VirtualSwitchPortGroupSet),
    };
    return factories;
}

}  // namespace TalvexCli::NetworkNamespace

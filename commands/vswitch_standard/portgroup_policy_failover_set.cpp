#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchPortGroupPolicyFailoverSet::VirtualSwitchPortGroupPolicyFailoverSet() {
    Frame::Describe(*this,
                    {"Configure the Failover policy for a port group. These setting may potentially override "
                     "virtual switch settings.",
                     "operation"});
}

InputSpecPtr VirtualSwitchPortGroupPolicyFailoverSet::GetInputSpecInternal() {
    auto spec = Frame::MakeInputSpec({
        {"portgroup-name", "p", Frame::kString, "The name of the port group to set failover policy for.",
         Frame::kRequired},
        VswitchStandard::UseVswitchParameter(false),
    });
    AddFailoverParameters(spec);
    return spec;
}

OutputSpecPtr VirtualSwitchPortGroupPolicyFailoverSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchPortGroupPolicyFailoverSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("portgroup-name");
    Frame::HostCall(output, [&] {
        auto group = HostCtl::Network::NetworkFactory::GetPortGroupByName(name);
        if (!group) {
            output->AddErrorMessage("Unable to find a port group with the name " + name);
            return;
        }
        const bool reset = input->IsFlagSet("use-vswitch");
        auto edited = group->GetOwnTeamingPolicy();
        if (reset) edited.UnsetAll();
        auto vswitch = group->GetVirtualSwitch();
        // After a reset the lists the other options start from are the switch's.
        auto reference = reset ? vswitch->GetTeamingPolicy() : group->GetTeamingPolicy();
        auto uplinks = vswitch->GetUplinkNames();
        SetFailoverPolicy(input, output, edited, reference, uplinks);
        if (!output->HasError()) group->UpdateTeamingPolicy(edited);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchPortGroupPolicySecuritySet::VirtualSwitchPortGroupPolicySecuritySet() {
    Frame::Describe(*this, {"Set the security policy for a given port group", "operator"});
}

InputSpecPtr VirtualSwitchPortGroupPolicySecuritySet::GetInputSpecInternal() {
    auto spec = Frame::MakeInputSpec({
        {"portgroup-name", "p", Frame::kString, "The name of the port group to set security policy for.",
         Frame::kRequired},
        VswitchStandard::UseVswitchParameter(true),
    });
    AddSecurityParameters(spec);
    return spec;
}

OutputSpecPtr VirtualSwitchPortGroupPolicySecuritySet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchPortGroupPolicySecuritySet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("portgroup-name");
    Frame::HostCall(output, [&] {
        auto group = HostCtl::Network::NetworkFactory::GetPortGroupByName(name);
        if (!group) {
            output->AddErrorMessage("Unable to find a port group with the name " + name);
            return;
        }
        auto policy = group->GetOwnSecurityPolicy();
        if (input->IsFlagSet("use-vswitch")) policy.UnsetAll();
        SetSecurityPolicy(input, output, policy);
        if (!output->HasError()) group->UpdateSecurityPolicy(policy);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

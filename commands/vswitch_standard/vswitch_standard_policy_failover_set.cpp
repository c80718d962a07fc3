#include "commands/vswitch_standard/vswitch_standard.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchStandardPolicyFailoverSet::VirtualSwitchStandardPolicyFailoverSet() {
    Frame::Describe(*this, {"Configure the Failover policy for a virtual switch.", "operation"});
}

InputSpecPtr VirtualSwitchStandardPolicyFailoverSet::GetInputSpecInternal() {
    auto spec = Frame::MakeInputSpec({
        {"vswitch-name", "v", Frame::kString,
         "The name of the virtual switch to use when configuring the switch failover policy.",
         Frame::kRequired},
    });
    AddFailoverParameters(spec);
    return spec;
}

OutputSpecPtr VirtualSwitchStandardPolicyFailoverSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchStandardPolicyFailoverSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vswitch-name");
    Frame::HostCall(output, [&] {
        auto vswitch = VswitchStandard::FindLegacySwitch(name);
        if (!vswitch) {
            output->AddErrorMessage("Unable to find a legacy virtual switch with the name " + name);
            return;
        }
        auto edited = vswitch->GetStoredTeamingPolicy();
        auto reference = vswitch->GetTeamingPolicy();
        auto uplinks = vswitch->GetUplinkNames();
        SetFailoverPolicy(input, output, edited, reference, uplinks);
        if (!output->HasError()) vswitch->UpdateTeamingPolicy(edited);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/vswitch_standard/vswitch_standard.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchStandardPolicyShapingSet::VirtualSwitchStandardPolicyShapingSet() {
    Frame::Describe(*this, {"Set the shaping policy settings for the given virtual switch", "operator"});
}

InputSpecPtr VirtualSwitchStandardPolicyShapingSet::GetInputSpecInternal() {
    auto spec = Frame::MakeInputSpec({
        {"vswitch-name", "v", Frame::kString,
         "The name of the virtual switch to use when setting the switch shaping policy.", Frame::kRequired},
    });
    AddShapingParameters(spec);
    return spec;
}

OutputSpecPtr VirtualSwitchStandardPolicyShapingSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchStandardPolicyShapingSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vswitch-name");
    Frame::HostCall(output, [&] {
        auto vswitch = VswitchStandard::FindLegacySwitch(name);
        if (!vswitch) {
            output->AddErrorMessage("Unable to find a legacy virtual switch with the name " + name);
            return;
        }
        auto policy = vswitch->GetShapingPolicy();
        SetShapingPolicy(input, output, policy, false);
        if (!output->HasError()) vswitch->UpdateShapingPolicy(policy);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

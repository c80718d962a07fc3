#include "commands/vswitch_standard/vswitch_standard.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchStandardPolicyShapingGet::VirtualSwitchStandardPolicyShapingGet() {
    Frame::Describe(
        *this, VswitchStandard::GetDescription("Get the shaping policy settings for the given virtual switch",
                                               "VirtualSwitchTrafficShapingPolicy", true, false));
}

InputSpecPtr VirtualSwitchStandardPolicyShapingGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vswitch-name", "v", Frame::kString,
         "The name of the virtual switch to use when fetching the switch shaping policy.", Frame::kRequired},
    });
}

OutputSpecPtr VirtualSwitchStandardPolicyShapingGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr VirtualSwitchStandardPolicyShapingGet::GetOutputStructure() {
    return VswitchStandard::ShapingRecord("VirtualSwitchTrafficShapingPolicy", false);
}

void VirtualSwitchStandardPolicyShapingGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vswitch-name");
    Frame::HostCall(output, [&] {
        auto vswitch = VswitchStandard::FindLegacySwitch(name);
        if (!vswitch) {
            output->AddErrorMessage("Unable to find a legacy virtual switch with the name " + name);
            return;
        }
        auto record = GetOutputStructure();
        VswitchStandard::FillShaping(*record, vswitch->GetShapingPolicy());
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

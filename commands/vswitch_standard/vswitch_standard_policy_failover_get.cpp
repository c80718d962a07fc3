#include "commands/vswitch_standard/vswitch_standard.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchStandardPolicyFailoverGet::VirtualSwitchStandardPolicyFailoverGet() {
    Frame::Describe(*this, VswitchStandard::GetDescription(
                               "Get the failover policy settings governing the given virtual switch",
                               "VirtualSwitchFailoverPolicy", false, false));
}

InputSpecPtr VirtualSwitchStandardPolicyFailoverGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vswitch-name", "v", Frame::kString,
         "The name of the virtual switch to use when fetching the switch failover policy.", Frame::kRequired},
    });
}

OutputSpecPtr VirtualSwitchStandardPolicyFailoverGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr VirtualSwitchStandardPolicyFailoverGet::GetOutputStructure() {
    return VswitchStandard::FailoverRecord("VirtualSwitchFailoverPolicy", false);
}

void VirtualSwitchStandardPolicyFailoverGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vswitch-name");
    Frame::HostCall(output, [&] {
        auto vswitch = VswitchStandard::FindLegacySwitch(name);
        if (!vswitch) {
            output->AddErrorMessage("Unable to find a legacy virtual switch with the name " + name);
            return;
        }
        auto record = GetOutputStructure();
        VswitchStandard::FillFailover(*record, vswitch->GetTeamingPolicy(), vswitch->GetUplinkNames());
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/vswitch_standard/vswitch_standard.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchStandardPolicySecurityGet::VirtualSwitchStandardPolicySecurityGet() {
    Frame::Describe(
        *this, VswitchStandard::GetDescription("Get the Security Policy governing the given virtual switch.",
                                               "VirtualSwitchSecurityPolicy", false, false));
}

InputSpecPtr VirtualSwitchStandardPolicySecurityGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vswitch-name", "v", Frame::kString,
         "The name of the virtual switch to use when fetching the network security policy.",
         Frame::kRequired},
    });
}

OutputSpecPtr VirtualSwitchStandardPolicySecurityGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr VirtualSwitchStandardPolicySecurityGet::GetOutputStructure() {
    return VswitchStandard::SecurityRecord("VirtualSwitchSecurityPolicy", false);
}

void VirtualSwitchStandardPolicySecurityGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vswitch-name");
    Frame::HostCall(output, [&] {
        auto vswitch = VswitchStandard::FindLegacySwitch(name);
        if (!vswitch) {
            output->AddErrorMessage("Unable to find a legacy virtual switch with the name " + name);
            return;
        }
        auto record = GetOutputStructure();
        VswitchStandard::FillSecurity(*record, vswitch->GetSecurityPolicy());
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

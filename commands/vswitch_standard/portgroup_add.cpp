#include "commands/vswitch_standard/vswitch_standard.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchPortGroupAdd::VirtualSwitchPortGroupAdd() {
    Frame::Describe(*this,
                    {"Allows the addition of a standard port group to a virtual switch.", "operation"});
}

InputSpecPtr VirtualSwitchPortGroupAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"portgroup-name", "p", Frame::kString, "The name of the port group to add", Frame::kRequired},
        {"vswitch-name", "v", Frame::kString, "The virtual switch to add the port group to.",
         Frame::kRequired},
    });
}

OutputSpecPtr VirtualSwitchPortGroupAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchPortGroupAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        auto vswitch = VswitchStandard::SwitchById(input->GetParameter("vswitch-name"));
        vswitch->AddPortGroup(input->GetParameter("portgroup-name"));
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/vswitch_standard/vswitch_standard.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchPortGroupRemove::VirtualSwitchPortGroupRemove() {
    Frame::Describe(*this, {"Remove a port group from the given virtual switch", "operation"});
}

InputSpecPtr VirtualSwitchPortGroupRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"portgroup-name", "p", Frame::kString, " ", Frame::kRequired},
        {"vswitch-name", "v", Frame::kString, " ", Frame::kRequired},
    });
}

OutputSpecPtr VirtualSwitchPortGroupRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchPortGroupRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        auto vswitch = VswitchStandard::SwitchById(input->GetParameter("vswitch-name"));
        vswitch->RemovePortGroup(input->GetParameter("portgroup-name"));
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

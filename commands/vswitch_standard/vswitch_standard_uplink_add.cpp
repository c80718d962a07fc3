#include "commands/vswitch_standard/vswitch_standard.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchStandardUplinkAdd::VirtualSwitchStandardUplinkAdd() {
    Frame::Describe(
        *this, {"Add an uplink to the given virtual switch. Note if this virtual switch has a NIC teaming "
                "policy assigned to it then the policy must also be modified to enable use of this uplink "
                "on this virtual switch",
                "operation"});
}

InputSpecPtr VirtualSwitchStandardUplinkAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vswitch-name", "v", Frame::kString, "The name of the virtual switch to add an uplink to.",
         Frame::kRequired},
        {"uplink-name", "u", Frame::kString, "The name of the uplink to add to the virtual switch.",
         Frame::kRequired},
    });
}

OutputSpecPtr VirtualSwitchStandardUplinkAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchStandardUplinkAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        auto vswitch = VswitchStandard::SwitchById(input->GetParameter("vswitch-name"));
        vswitch->AddUplink(input->GetParameter("uplink-name"));
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

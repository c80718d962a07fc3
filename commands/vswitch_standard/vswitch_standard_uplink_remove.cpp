#include "commands/vswitch_standard/vswitch_standard.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchStandardUplinkRemove::VirtualSwitchStandardUplinkRemove() {
    Frame::Describe(*this,
                    {"Remove an uplink from the given virtual switch. Note if this virtual switch has a NIC "
                     "teaming policy assigned to it then the policy must also be modified to disable use of "
                     "this uplink on this virtual switch",
                     "operation"});
}

InputSpecPtr VirtualSwitchStandardUplinkRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vswitch-name", "v", Frame::kString, "The name of the virtual switch to remove an uplink from.",
         Frame::kRequired},
        {"uplink-name", "u", Frame::kString, "The name of the uplink to remove from the virtual switch.",
         Frame::kRequired},
    });
}

OutputSpecPtr VirtualSwitchStandardUplinkRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchStandardUplinkRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        auto vswitch = VswitchStandard::SwitchById(input->GetParameter("vswitch-name"));
        vswitch->RemoveUplink(input->GetParameter("uplink-name"), false);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchStandardRemove::VirtualSwitchStandardRemove() {
    Frame::Describe(*this, {"Remove a virtual switch from the Hadro networking system.", "operation"});
}

InputSpecPtr VirtualSwitchStandardRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vswitch-name", "v", Frame::kString, "The name of the virtual switch to remove.", Frame::kRequired},
    });
}

OutputSpecPtr VirtualSwitchStandardRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchStandardRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vswitch-name");
    Frame::HostCall(output, [&] {
        if (!TknCtl::Network::PortsetImpl::IsValidVirtualSwitch(name)) {
            output->AddErrorMessage("Unable to find virtual switch with the name " + name);
            return;
        }
        TknCtl::Network::VirtualSwitchInfoImpl info;
        info.RemoveVirtualSwitch(name);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

NicVlanStatsSet::NicVlanStatsSet() {
    Frame::Describe(*this, {"Enable/disable VLAN statistics collection on the NIC.", "operation"});
}

InputSpecPtr NicVlanStatsSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"nic-name", "n", Frame::kString, "Name of the NIC to get statistics from.", Frame::kRequired},
        {"enabled", "e", Frame::kBool, "Whether to enable or disable VLAN statistics"},
    });
}

OutputSpecPtr NicVlanStatsSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicVlanStatsSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("nic-name");
    const bool enabled = input->GetParameterBool("enabled");
    Frame::HostCall(output, "Unable to set VLAN stats: ", [&] {
        TknCtl::Network::VirtualSwitchInfoImpl switches;
        auto portset = Nic::SwitchOfUplink(switches.GetAllSwitches(), name);
        if (!portset) {
            output->AddErrorMessage(name + " is not a valid NIC connected to any virtual switch.");
            return;
        }
        portset->SetVlanStatsEnabled(name, enabled);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

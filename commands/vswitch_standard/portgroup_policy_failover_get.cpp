#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchPortGroupPolicyFailoverGet::VirtualSwitchPortGroupPolicyFailoverGet() {
    Frame::Describe(*this, VswitchStandard::GetDescription(
                               "Get the network failover policy settings governing the given port group",
                               "PortGroupFailoverPolicy", false, true));
}

InputSpecPtr VirtualSwitchPortGroupPolicyFailoverGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"portgroup-name", "p", Frame::kString,
         "The name of the port group to use when fetching the port group failover policy.", Frame::kRequired},
    });
}

OutputSpecPtr VirtualSwitchPortGroupPolicyFailoverGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr VirtualSwitchPortGroupPolicyFailoverGet::GetOutputStructure() {
    return VswitchStandard::FailoverRecord("PortGroupFailoverPolicy", true);
}

void VirtualSwitchPortGroupPolicyFailoverGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("portgroup-name");
    Frame::HostCall(output, [&] {
        auto group = HostCtl::Network::NetworkFactory::GetPortGroupByName(name);
        if (!group) {
            output->AddErrorMessage("Unable to find a port group with the name " + name);
            return;
        }
        auto record = GetOutputStructure();
        VswitchStandard::FillFailover(*record, group->GetTeamingPolicy(),
                                      group->GetVirtualSwitch()->GetUplinkNames());
        VswitchStandard::FillFailoverOverrides(*record, group->GetOwnTeamingPolicy());
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

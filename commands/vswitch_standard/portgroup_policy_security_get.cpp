#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchPortGroupPolicySecurityGet::VirtualSwitchPortGroupPolicySecurityGet() {
    Frame::Describe(
        *this, VswitchStandard::GetDescription("Get the Security Policy governing the given port group. ",
                                               "PortGroupSecurityPolicy", false, true));
}

InputSpecPtr VirtualSwitchPortGroupPolicySecurityGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"portgroup-name", "p", Frame::kString,
         "The name of the port group to use when fetching the network security policy.", Frame::kRequired},
    });
}

OutputSpecPtr VirtualSwitchPortGroupPolicySecurityGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr VirtualSwitchPortGroupPolicySecurityGet::GetOutputStructure() {
    return VswitchStandard::SecurityRecord("PortGroupSecurityPolicy", true);
}

void VirtualSwitchPortGroupPolicySecurityGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("portgroup-name");
    Frame::HostCall(output, [&] {
        auto group = HostCtl::Network::NetworkFactory::GetPortGroupByName(name);
        if (!group) {
            output->AddErrorMessage("Unable to find a port group with the name " + name);
            return;
        }
        auto record = GetOutputStructure();
        VswitchStandard::FillSecurity(*record, group->GetSecurityPolicy());
        VswitchStandard::FillSecurityOverrides(*record, group->GetOwnSecurityPolicy());
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchPortGroupPolicyShapingGet::VirtualSwitchPortGroupPolicyShapingGet() {
    Frame::Describe(*this, VswitchStandard::GetDescription(
                               "Get the network shaping policy settings governing the given port group",
                               "PortGroupTrafficShapingPolicy", true, true));
}

InputSpecPtr VirtualSwitchPortGroupPolicyShapingGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"portgroup-name", "p", Frame::kString,
         "The name of the port group to use when fetching the port group shaping policy.", Frame::kRequired},
    });
}

OutputSpecPtr VirtualSwitchPortGroupPolicyShapingGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr VirtualSwitchPortGroupPolicyShapingGet::GetOutputStructure() {
    return VswitchStandard::ShapingRecord("PortGroupTrafficShapingPolicy", true);
}

void VirtualSwitchPortGroupPolicyShapingGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("portgroup-name");
    Frame::HostCall(output, [&] {
        auto group = HostCtl::Network::NetworkFactory::GetPortGroupByName(name);
        if (!group) {
            output->AddErrorMessage("Unable to find a port group with the name " + name);
            return;
        }
        auto record = GetOutputStructure();
        VswitchStandard::FillShaping(*record, group->GetShapingPolicy());
        VswitchStandard::FillShapingOverrides(*record, group->GetOwnShapingPolicy());
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

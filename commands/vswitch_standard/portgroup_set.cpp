#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::PortGroup;

VirtualSwitchPortGroupSet::VirtualSwitchPortGroupSet() {
    Frame::Describe(*this, {"Set the vlan id for the given port group", "operator"});
}

InputSpecPtr VirtualSwitchPortGroupSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"portgroup-name", "p", Frame::kString, "The name of the port group to set vlan id for.",
         Frame::kRequired},
        {"vlan-id", "v", Frame::kInt,
         "The vlan id for this port group. This value is in the range (" +
             std::to_string(PortGroup::MIN_VLAN_ID) + " - " + std::to_string(PortGroup::MAX_VLAN_ID) + ")",
         Frame::kOptional, Frame::Range(PortGroup::MIN_VLAN_ID, PortGroup::MAX_VLAN_ID)},
    });
}

OutputSpecPtr VirtualSwitchPortGroupSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchPortGroupSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("portgroup-name");
    Frame::HostCall(output, [&] {
        auto group = HostCtl::Network::NetworkFactory::GetPortGroupByName(name);
        if (!group) {
            output->AddErrorMessage("Unable to find a port group with the name " + name);
            return;
        }
        // Without "vlan-id" the port group keeps its VLAN: an omitted option must not move a
        // live port group to VLAN 0.
        if (input->HasParameter("vlan-id"))
            group->SetVlanId(static_cast<std::uint16_t>(input->GetParameterInt("vlan-id")));
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

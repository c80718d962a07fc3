#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchPortGroupPolicyShapingSet::VirtualSwitchPortGroupPolicyShapingSet() {
    Frame::Describe(*this, {"Set the shaping policy settings for the given port group", "operator"});
}

InputSpecPtr VirtualSwitchPortGroupPolicyShapingSet::GetInputSpecInternal() {
    auto spec = Frame::MakeInputSpec({
        {"portgroup-name", "p", Frame::kString, "The name of the port group to set shaping policy for.",
         Frame::kRequired},
        VswitchStandard::UseVswitchParameter(false),
    });
    AddShapingParameters(spec);
    return spec;
}

OutputSpecPtr VirtualSwitchPortGroupPolicyShapingSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchPortGroupPolicyShapingSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("portgroup-name");
    Frame::HostCall(output, [&] {
        auto group = HostCtl::Network::NetworkFactory::GetPortGroupByName(name);
        if (!group) {
            output->AddErrorMessage("Unable to find a port group with the name " + name);
            return;
        }
        const bool reset = input->IsFlagSet("use-vswitch");
        auto own = group->GetOwnShapingPolicy();
        if (reset) own.UnsetAll();
        SetShapingPolicy(input, output, own, false);
        if (own.IsEnabledSet() && own.IsEnabled()) {
            // An enabled policy needs its three values, from the port group or from the switch.
            auto effective =
                reset ? group->GetVirtualSwitch()->GetShapingPolicy() : group->GetShapingPolicy();
            if (!own.IsPeakBpsSet() && !effective.IsPeakBpsSet()) {
                output->AddErrorMessage(
                    "Unable to set shaping policy. A Peak BPS value must be set on either this port group or "
                    "on the "
                    "parent virtual switch.");
            }
            if (!own.IsAverageBpsSet() && !effective.IsAverageBpsSet()) {
                output->AddErrorMessage(
                    "Unable to set shaping policy. An Average BPS value must be set on either this port "
                    "group or on "
                    "the parent virtual switch.");
            }
            if (!own.IsBurstSizeSet() && !effective.IsBurstSizeSet()) {
                output->AddErrorMessage(
                    "Unable to set shaping policy. A Burst Size value must be set on either this port group "
                    "or on "
                    "the parent virtual switch.");
            }
        }
        if (!output->HasError()) group->UpdateShapingPolicy(own);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

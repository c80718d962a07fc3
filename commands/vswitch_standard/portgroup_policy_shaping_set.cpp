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
        // What the port group has in force once its overrides are dropped or kept.
        const auto effective =
            reset ? group->GetVirtualSwitch()->GetShapingPolicy() : group->GetShapingPolicy();
        if (!own.IsEnabledSet() && effective.IsEnabled() && !input->HasParameter("enabled")) {
            // Shaping is on through the switch: the values given override the switch's, while
            // "enabled" keeps following it.
            auto edited = own;
            edited.SetEnabled(true);
            SetShapingPolicy(input, output, edited, false);
            own = HostCtl::Network::ShapingPolicy();
            if (edited.IsAverageBpsSet()) own.SetAverageBps(edited.GetAverageBps());
            if (edited.IsPeakBpsSet()) own.SetPeakBps(edited.GetPeakBps());
            if (edited.IsBurstSizeSet()) own.SetBurstSize(edited.GetBurstSize());
        } else {
            SetShapingPolicy(input, output, own, false);
        }
        if (own.IsEnabledSet() && own.IsEnabled()) {
            // An enabled policy needs its three values, from the port group or from the switch.
            const std::string prefix = "Unable to set shaping policy. ";
            const std::string where =
                " must be set on either this port group or on the parent virtual switch.";
            if (!own.IsPeakBpsSet() && !effective.IsPeakBpsSet())
                output->AddErrorMessage(prefix + "A Peak BPS value" + where);
            if (!own.IsAverageBpsSet() && !effective.IsAverageBpsSet())
                output->AddErrorMessage(prefix + "An Average BPS value" + where);
            if (!own.IsBurstSizeSet() && !effective.IsBurstSizeSet())
                output->AddErrorMessage(prefix + "A Burst Size value" + where);
        }
        if (!output->HasError()) group->UpdateShapingPolicy(own);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

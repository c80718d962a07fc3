#include "commands/vswitch_standard/vswitch_standard.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchStandardPolicySecuritySet::VirtualSwitchStandardPolicySecuritySet() {
    Frame::Describe(*this, {"Set the security policy for a given virtual switch", "operator"});
}

InputSpecPtr VirtualSwitchStandardPolicySecuritySet::GetInputSpecInternal() {
    // "p" names promiscuous mode here: there is no port-group name to take it.
    return Frame::MakeInputSpec({
        {"vswitch-name", "v", Frame::kString,
         "The name of the virtual switch to use when setting the switch security policy.", Frame::kRequired},
        {"allow-promiscuous", "p", Frame::kBool,
         "Allow ports on the virtual switch to enter promiscuous mode."},
        {"allow-mac-change", "m", Frame::kBool,
         "Allow ports on the virtual switch to change their MAC address."},
        {"allow-forged-transmits", "f", Frame::kBool,
         "Allow ports on the virtual switch to send packets with forged source information."},
    });
}

OutputSpecPtr VirtualSwitchStandardPolicySecuritySet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchStandardPolicySecuritySet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vswitch-name");
    Frame::HostCall(output, [&] {
        auto vswitch = VswitchStandard::FindLegacySwitch(name);
        if (!vswitch) {
            output->AddErrorMessage("Unable to find a legacy virtual switch with the name " + name);
            return;
        }
        auto policy = vswitch->GetSecurityPolicy();
        if (input->HasParameter("allow-promiscuous"))
            policy.SetAllowPromiscuous(input->GetParameterBool("allow-promiscuous"));
        if (input->HasParameter("allow-mac-change"))
            policy.SetAllowMacAddressChange(input->GetParameterBool("allow-mac-change"));
        if (input->HasParameter("allow-forged-transmits"))
            policy.SetAllowForgedTransmits(input->GetParameterBool("allow-forged-transmits"));
        if (!output->HasError()) vswitch->UpdateSecurityPolicy(policy);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

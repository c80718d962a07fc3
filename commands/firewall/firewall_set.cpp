#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallSet::FirewallSet() {
    Frame::Describe(*this, {"Set firewall enabled status and default action.", "operation"});
}

InputSpecPtr FirewallSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"enabled", "e", Frame::kBool,
         "Set to true to enable the firewall, set to false to disable the firewall."},
        {"default-action", "d", Frame::kBool, "Set to true to set defaultaction PASS, set to false to DROP."},
    });
}

OutputSpecPtr FirewallSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void FirewallSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::System::SystemInfoImpl system;
        const bool hasEnabled = input->HasParameter("enabled");
        const bool hasAction = input->HasParameter("default-action");
        if (!hasEnabled && !hasAction) {
            output->AddErrorMessage("Need parameter --enabled or --default-action");
            return;
        }
        TknCtl::System::ModuleImpl module(Firewall::kModuleName);
        if (!Firewall::IsModuleLoaded(module)) {
            output->AddErrorMessage("Firewall module is not loaded");
            return;
        }
        const bool enabled = system.IsFirewallEnabled();
        const bool pass = system.GetFirewallDefaultAction();
        if (hasEnabled) {
            const bool wanted = input->GetParameterBool("enabled");
            if (wanted != enabled) system.SetFirewallEnabled(wanted);
        }
        if (hasAction) {
            const bool wanted = input->GetParameterBool("default-action");
            if (wanted == pass) {
                // A change of the enabled flag made above stays.
                output->AddErrorMessage(pass ? "Default action already PASS" : "Default action already DROP");
                return;
            }
            system.SetFirewallDefaultAction(wanted);
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallRulesetSet::FirewallRulesetSet() {
    Frame::Describe(*this,
                    {"Set firewall ruleset status (allowedAll flag and enabled status).", "operation"});
}

InputSpecPtr FirewallRulesetSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"ruleset-id", "r", Frame::kString, "The label of the ruleset.", Frame::kRequired},
        {"allowed-all", "a", Frame::kBool,
         "Set to true to allowed all ip, set to false to use allowed ip list."},
        {"enabled", "e", Frame::kBool, "Set to true to enable ruleset, set to false to disable it."},
    });
}

OutputSpecPtr FirewallRulesetSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void FirewallRulesetSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& id = input->GetParameter("ruleset-id");
    const bool hasAllowedAll = input->HasParameter("allowed-all");
    const bool hasEnabled = input->HasParameter("enabled");
    if (!hasAllowedAll && !hasEnabled) {
        output->AddErrorMessage("Need parameter --enabled or --allowed-all");
        return;
    }
    Frame::HostCall(output, [&] {
        TknCtl::System::SystemInfoImpl system;
        auto ruleset = system.GetFirewallRulesetById(id);
        if (!ruleset->IsValid()) {
            output->AddErrorMessage("Invalid Ruleset Id.");
            return;
        }
        const bool enabled = ruleset->IsEnabled();
        const bool allowedAll = ruleset->IsAllowedAll();
        if (hasAllowedAll) {
            const bool wanted = input->GetParameterBool("allowed-all");
            if (wanted == allowedAll) {
                output->AddErrorMessage(allowedAll ? "Already allowed all ip"
                                                   : "Already use allowed ip list");
                return;
            }
            ruleset->SetAllowedAll(wanted);
        }
        if (hasEnabled) {
            const bool wanted = input->GetParameterBool("enabled");
            if (wanted != enabled) {
                if (enabled)
                    ruleset->Disable();
                else
                    ruleset->Enable();
            }
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

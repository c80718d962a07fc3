// Steps the firewall commands share: the module check, the choice of rulesets to list, the
// allowed-list edits and the ruleset of the client commands.
#include "commands/firewall/firewall.h"

#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace::Firewall {

const char* const kModuleName = "hadrofw";

bool IsModuleLoaded(TknCtl::System::ModuleImpl& module) {
    if (module.IsStale()) {
        module.Refresh();
        module.SetStale(false);
    }
    return module.IsLoaded();
}

bool SelectRulesets(const Zorbel::CallSpec::Input& input, const OutputPtr& output,
                    TknCtl::System::SystemInfoImpl& system,
                    std::vector<std::unique_ptr<HostCtl::System::FirewallRuleset>>& selection) {
    if (input.HasParameter("ruleset-id")) {
        const std::string& id = input.GetParameter("ruleset-id");
        std::unique_ptr<HostCtl::System::FirewallRuleset> ruleset;
        bool valid = false;
        try {
            ruleset = system.GetFirewallRulesetById(id);
            valid = ruleset->IsValid();
        } catch (const HostCtl::Lib::HostCtlException&) {
            output->AddErrorMessage("Failed to check loaded status: " + id);
            return false;
        }
        if (!valid) {
            output->AddErrorMessage("Ruleset Not Found: " + id);
            return false;
        }
        selection.push_back(std::move(ruleset));
        return true;
    }
    return Frame::HostCall(output, [&] { selection = system.GetFirewallRulesets(); });
}

void UpdateAllowedIp(const Zorbel::CallSpec::Input& input, const OutputPtr& output,
                     const std::function<void(HostCtl::System::FirewallRuleset&, const std::string&)>& edit) {
    const std::string& id = input.GetParameter("ruleset-id");
    const std::string& address = input.GetParameter("ip-address");
    Frame::HostCall(output, [&] {
        TknCtl::System::SystemInfoImpl system;
        auto ruleset = system.GetFirewallRulesetById(id);
        if (!ruleset->IsValid()) {
            output->AddErrorMessage("Invalid Ruleset Id.");
            return;
        }
        if (ruleset->IsAllowedAll()) {
            output->AddErrorMessage("Couldn't update allowed ip list when allowed-all flag is true.");
            return;
        }
        if (address.empty()) {
            output->AddErrorMessage("Invalid allowedip parameter.");
            return;
        }
        edit(*ruleset, address);
        Frame::SetResult(output, true);
    });
}

void WithClientRuleset(const Zorbel::CallSpec::Input& input, const OutputPtr& output,
                       const std::function<void(HostCtl::System::FirewallRuleset&)>& step) {
    const std::string& id = input.GetParameter("ruleset-id");
    Frame::HostCall(output, [&] {
        auto host = HostCtl::HostFactory::GetHost();
        auto system = host->GetSystemInfo();
        auto ruleset = system->GetFirewallRulesetById(id);
        if (!ruleset->IsValid()) {
            output->AddErrorMessage("Invalid Ruleset Id.");
            return;
        }
        step(*ruleset);
    });
}

}  // namespace TalvexCli::NetworkNamespace::Firewall

#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallRulesetList::FirewallRulesetList() {
    Frame::Describe(
        *this, {"List the rulesets in firewall.", "fetcher", "table", {{"fields:Ruleset", "Name,Enabled"}}});
}

InputSpecPtr FirewallRulesetList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"ruleset-id", "r", Frame::kString, "List configuration for specfic ruleset"},
    });
}

OutputSpecPtr FirewallRulesetList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr FirewallRulesetList::GetOutputStructure() {
    return Frame::MakeRecord("Ruleset", {Frame::StringField("Name"), Frame::BoolField("Enabled")});
}

void FirewallRulesetList::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::System::SystemInfoImpl system;
        auto list = Frame::MakeList(GetOutputStructure());
        std::vector<std::unique_ptr<HostCtl::System::FirewallRuleset>> selection;
        if (!Firewall::SelectRulesets(*input, output, system, selection)) return;
        for (const auto& ruleset : selection) {
            auto record = GetOutputStructure();
            record->SetField("Name", ruleset->GetName());
            record->SetField("Enabled", ruleset->IsEnabled());
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

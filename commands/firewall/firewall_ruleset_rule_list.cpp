#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallRulesetRuleList::FirewallRulesetRuleList() {
    SetDescription("List the rules of each ruleset in firewall.");
    SetMetaDataField("type", "fetcher");
    SetDefaultOutputFormatter("simple");
    SetDefaultOutputFormatter("table");
    SetDefaultOutputParameter("fields:FirewallPortRule",
                              "Ruleset,Direction,Protocol,Port Type,Port Begin,Port End");
}

InputSpecPtr FirewallRulesetRuleList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"ruleset-id", "r", Frame::kString, "List rules for specfic ruleset"},
    });
}

OutputSpecPtr FirewallRulesetRuleList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr FirewallRulesetRuleList::GetOutputStructure() {
    return Frame::MakeRecord(
        "FirewallPortRule",
        {Frame::StringField("Ruleset"), Frame::StringField("Port Type"), Frame::IntField("Port Begin"),
         Frame::IntField("Port End"), Frame::StringField("Direction"), Frame::StringField("Protocol")});
}

void FirewallRulesetRuleList::ExecuteInternal(InputPtr input, OutputPtr output) {
    using HostCtl::System::FirewallRule;
    Frame::HostCall(output, [&] {
        TknCtl::System::SystemInfoImpl system;
        auto list = Frame::MakeList(GetOutputStructure());
        std::vector<std::unique_ptr<HostCtl::System::FirewallRuleset>> selection;
        if (!Firewall::SelectRulesets(*input, output, system, selection)) return;
        for (const auto& ruleset : selection) {
            const std::string name = ruleset->GetName();
            for (const auto& rule : ruleset->GetRules()) {
                auto record = GetOutputStructure();
                record->SetField("Ruleset", name);
                record->SetField("Port Type",
                                 rule->GetPortType() == FirewallRule::PORT_TYPE_DST ? "Dst" : "Src");
                record->SetField("Port Begin", static_cast<long>(rule->GetPortBegin()));
                record->SetField("Port End", static_cast<long>(rule->GetPortEnd()));
                record->SetField("Direction", rule->GetDirection() == FirewallRule::DIRECTION_INBOUND
                                                  ? "Inbound"
                                                  : "Outbound");
                record->SetField("Protocol",
                                 rule->GetProtocol() == FirewallRule::PROTOCOL_TCP ? "TCP" : "UDP");
                list->Add(record);
            }
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

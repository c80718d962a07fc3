#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallRulesetClientGet::FirewallRulesetClientGet() {
    Frame::Describe(*this, {"Show the number of clients using a firewall ruleset.",
                            "fetcher",
                            "simple",
                            {{"fields:FirewallRulesetClientGet", "Ruleset Client Count"}}});
}

InputSpecPtr FirewallRulesetClientGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"ruleset-id", "r", Frame::kString, "The label of the ruleset.", Frame::kRequired},
    });
}

OutputSpecPtr FirewallRulesetClientGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr FirewallRulesetClientGet::GetOutputStructure() {
    return Frame::MakeRecord("FirewallRulesetClientGet", {Frame::IntField("Ruleset Client Count")});
}

void FirewallRulesetClientGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    Firewall::WithClientRuleset(*input, output, [&](HostCtl::System::FirewallRuleset& ruleset) {
        auto record = GetOutputStructure();
        record->SetField("Ruleset Client Count", static_cast<long>(ruleset.GetClientCount()));
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

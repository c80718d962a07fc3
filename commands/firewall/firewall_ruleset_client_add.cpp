#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallRulesetClientAdd::FirewallRulesetClientAdd() {
    Frame::Describe(*this, {"Add a new client to a firewall ruleset. This enables the firewall ruleset and "
                            "increments the number of clients using the ruleset.",
                            "operation"});
}

InputSpecPtr FirewallRulesetClientAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"ruleset-id", "r", Frame::kString, "The label of the ruleset.", Frame::kRequired},
    });
}

OutputSpecPtr FirewallRulesetClientAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void FirewallRulesetClientAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    Firewall::WithClientRuleset(*input, output, [&](HostCtl::System::FirewallRuleset& ruleset) {
        ruleset.AddClient();
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

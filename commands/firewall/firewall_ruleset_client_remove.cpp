#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallRulesetClientRemove::FirewallRulesetClientRemove() {
    Frame::Describe(*this, {"Remove a client from a firewall ruleset. This decrements the number of clients "
                            "using the ruleset and if the number reaches zero the ruleset is disabled.",
                            "operation"});
}

InputSpecPtr FirewallRulesetClientRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"ruleset-id", "r", Frame::kString, "The label of the ruleset.", Frame::kRequired},
    });
}

OutputSpecPtr FirewallRulesetClientRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void FirewallRulesetClientRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    Firewall::WithClientRuleset(*input, output, [&](HostCtl::System::FirewallRuleset& ruleset) {
        ruleset.RemoveClient();
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallRulesetAllowedipRemove::FirewallRulesetAllowedipRemove() {
    Frame::Describe(*this, {"Remove allowed ip address/range from the ruleset.", "operation"});
}

InputSpecPtr FirewallRulesetAllowedipRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"ruleset-id", "r", Frame::kString, "The label of the ruleset.", Frame::kRequired},
        {"ip-address", "i", Frame::kString, "Allowed ip address/range for the ruleset.", Frame::kRequired},
    });
}

OutputSpecPtr FirewallRulesetAllowedipRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void FirewallRulesetAllowedipRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    Firewall::UpdateAllowedIp(*input, output,
                              [](HostCtl::System::FirewallRuleset& ruleset, const std::string& address) {
                                  ruleset.RemoveAllowedIp(address);
                              });
}

}  // namespace TalvexCli::NetworkNamespace

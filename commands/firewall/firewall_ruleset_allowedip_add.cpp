#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallRulesetAllowedipAdd::FirewallRulesetAllowedipAdd() {
    Frame::Describe(*this, {"Add allowed ip address/range to the ruleset ruleset.", "operation"});
}

InputSpecPtr FirewallRulesetAllowedipAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"ruleset-id", "r", Frame::kString, "The label of the ruleset.", Frame::kRequired},
        {"ip-address", "i", Frame::kString, "Allowed ip address/range for the ruleset.", Frame::kRequired},
    });
}

OutputSpecPtr FirewallRulesetAllowedipAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void FirewallRulesetAllowedipAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    Firewall::UpdateAllowedIp(*input, output,
                              [](HostCtl::System::FirewallRuleset& ruleset, const std::string& address) {
                                  ruleset.AddAllowedIp(address);
                              });
}

}  // namespace TalvexCli::NetworkNamespace

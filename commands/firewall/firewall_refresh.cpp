#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallRefresh::FirewallRefresh() {
    Frame::Describe(*this, {"Load ruleset configuration for firewall.", "operation"});
}

InputSpecPtr FirewallRefresh::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr FirewallRefresh::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void FirewallRefresh::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::System::SystemInfoImpl system;
        // Reloading the configuration drops the rules added at run time: put them back.
        auto dynamicRules = system.GetFirewallDynamicRules();
        system.LoadFirewallRulesets();
        for (auto& rule : dynamicRules)
            system.AddFirewallDynamicRule(*rule);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

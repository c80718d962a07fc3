#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallLoad::FirewallLoad() {
    Frame::Describe(*this, {"Load firewall module and rulesets configuration.", "operation"});
}

InputSpecPtr FirewallLoad::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr FirewallLoad::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void FirewallLoad::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::System::SystemInfoImpl system;
        TknCtl::System::ModuleImpl module(Firewall::kModuleName);
        module.Load(HostCtl::emptyString, false);
        system.LoadFirewallRulesets();
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

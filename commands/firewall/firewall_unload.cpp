#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallUnload::FirewallUnload() {
    Frame::Describe(*this, {"Allow unload firewall module.", "operation"});
}

InputSpecPtr FirewallUnload::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr FirewallUnload::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void FirewallUnload::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::System::SystemInfoImpl system;
        TknCtl::System::ModuleImpl module(Firewall::kModuleName);
        // Unloading a module that is not loaded succeeds without doing anything.
        if (Firewall::IsModuleLoaded(module)) {
            system.DestroyFirewallFilters();
            module.Unload();
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

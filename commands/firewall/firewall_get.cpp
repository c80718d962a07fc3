#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallGet::FirewallGet() {
    Frame::Describe(*this, {"Get the firewall status.", "fetcher", "simple"});
}

InputSpecPtr FirewallGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr FirewallGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr FirewallGet::GetOutputStructure() {
    return Frame::MakeRecord("Firewall", {Frame::BoolField("Loaded"), Frame::BoolField("Enabled"),
                                          Frame::StringField("DefaultAction")});
}

void FirewallGet::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, "Unable to get firewall status.\n", [&] {
        TknCtl::System::SystemInfoImpl system;
        TknCtl::System::ModuleImpl module(Firewall::kModuleName);
        bool loaded = Firewall::IsModuleLoaded(module);
        // Without the module the firewall filters nothing: it is off and lets everything pass.
        bool enabled = false;
        bool pass = true;
        if (loaded) {
            enabled = system.IsFirewallEnabled();
            pass = system.GetFirewallDefaultAction();
        }
        auto record = GetOutputStructure();
        record->SetField("Loaded", loaded);
        record->SetField("Enabled", enabled);
        record->SetField("DefaultAction", pass ? "PASS" : "DROP");
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

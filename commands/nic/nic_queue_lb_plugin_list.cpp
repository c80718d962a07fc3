#include <algorithm>

#include "commands/nic/nic.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicQueueLbPluginList::NicQueueLbPluginList() {
    Frame::Describe(
        *this, {"Details of netqueue balancer plugins on all physical NICs currently installed and loaded "
                "on the system",
                "fetcher",
                "table",
                {{"fields:NetqBalPlugin", "NIC,Module Name,Plugin Name,Enabled,Description"},
                 {"wrap-last", "true"}}});
}

InputSpecPtr NicQueueLbPluginList::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"vmnic", "n", Frame::kString, "The name of pnic to get netqueue plugin details"}});
}

OutputSpecPtr NicQueueLbPluginList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicQueueLbPluginList::GetOutputStructure() {
    return Frame::MakeRecord("NetqBalPlugin", {Frame::StringField("NIC"), Frame::StringField("Module Name"),
                                               Frame::StringField("Plugin Name"), Frame::BoolField("Enabled"),
                                               Frame::StringField("Description")});
}

void NicQueueLbPluginList::ExecuteInternal(InputPtr input, OutputPtr output) {
    const bool named = input->HasParameter("vmnic");
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        auto list = Frame::MakeList(GetOutputStructure());
        Nic::ForEachNetqueue(
            named ? &name : nullptr, "Invalid PNIC name " + name,
            [&](HostCtl::Network::Pnic& pnic, const HostCtl::Network::PnicNetqueueInfo& netqueue) {
                for (const auto& plugin : netqueue.plugins) {
                    const bool enabled = std::any_of(
                        netqueue.enabledPlugins.begin(), netqueue.enabledPlugins.end(), [&](const auto& on) {
                            return on.moduleName == plugin.moduleName && on.pluginName == plugin.pluginName;
                        });
                    auto record = GetOutputStructure();
                    record->SetField("NIC", pnic.GetName());
                    record->SetField("Module Name", plugin.moduleName);
                    record->SetField("Plugin Name", plugin.pluginName);
                    record->SetField("Enabled", enabled);
                    record->SetField("Description", plugin.description);
                    list->Add(record);
                }
            });
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

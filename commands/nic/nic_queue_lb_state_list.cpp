#include "commands/nic/nic.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicQueueLbStateList::NicQueueLbStateList() {
    Frame::Describe(
        *this, {"Netqueue balancer state of all physical NICs currently installed and loaded on the system",
                "fetcher",
                "table",
                {{"fields:NetqBalState", "NIC,Enabled"}}});
}

InputSpecPtr NicQueueLbStateList::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"vmnic", "n", Frame::kString, "The name of pnic to get netqueue balancer state"}});
}

OutputSpecPtr NicQueueLbStateList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicQueueLbStateList::GetOutputStructure() {
    return Frame::MakeRecord("NetqBalState", {Frame::StringField("NIC"), Frame::BoolField("Enabled")});
}

void NicQueueLbStateList::ExecuteInternal(InputPtr input, OutputPtr output) {
    const bool named = input->HasParameter("vmnic");
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        auto list = Frame::MakeList(GetOutputStructure());
        Nic::ForEachNetqueue(
            named ? &name : nullptr, "Invalid PNIC name " + name,
            [&](HostCtl::Network::Pnic& pnic, const HostCtl::Network::PnicNetqueueInfo& netqueue) {
                auto record = GetOutputStructure();
                record->SetField("NIC", pnic.GetName());
                record->SetField("Enabled", netqueue.balancerEnabled);
                list->Add(record);
            });
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

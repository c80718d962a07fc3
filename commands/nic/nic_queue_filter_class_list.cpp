#include "commands/nic/nic.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicQueueFilterClassList::NicQueueFilterClassList() {
    Frame::Describe(*this,
                    {"List the netqueue supported filterclass of all physical NICs currently installed and "
                     "loaded on the system.",
                     "fetcher",
                     "table",
                     {{"fields:Settings", "NIC,MacOnly,VlanOnly,VlanMac,Vxlan,Geneve,GenericEncap"}}});
}

InputSpecPtr NicQueueFilterClassList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr NicQueueFilterClassList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicQueueFilterClassList::GetOutputStructure() {
    return Frame::MakeRecord(
        "Settings", {Frame::StringField("NIC"), Frame::BoolField("MacOnly"), Frame::BoolField("VlanOnly"),
                     Frame::BoolField("VlanMac"), Frame::BoolField("Vxlan"), Frame::BoolField("Geneve"),
                     Frame::BoolField("GenericEncap")});
}

void NicQueueFilterClassList::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, [&] {
        auto list = Frame::MakeList(GetOutputStructure());
        Nic::ForEachNetqueue(
            nullptr, {},
            [&](HostCtl::Network::Pnic& pnic, const HostCtl::Network::PnicNetqueueInfo& netqueue) {
                auto record = GetOutputStructure();
                record->SetField("NIC", pnic.GetName());
                record->SetField("MacOnly", netqueue.filterMacOnly);
                record->SetField("VlanOnly", netqueue.filterVlanOnly);
                record->SetField("VlanMac", netqueue.filterVlanMac);
                record->SetField("Vxlan", netqueue.filterVxlan);
                record->SetField("Geneve", netqueue.filterGeneve);
                record->SetField("GenericEncap", netqueue.filterGenericEncap);
                list->Add(record);
            });
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

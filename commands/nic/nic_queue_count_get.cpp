#include "commands/nic/nic.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicQueueCountGet::NicQueueCountGet() {
    Frame::Describe(*this, {"Get netqueue count on a nic",
                            "fetcher",
                            "table",
                            {{"fields:NetqueueCount", "NIC,Tx netqueue count,Rx netqueue count"}}});
}

InputSpecPtr NicQueueCountGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({{"vmnic", "n", Frame::kString, "The name of pnic to get netqueue count"}});
}

OutputSpecPtr NicQueueCountGet::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicQueueCountGet::GetOutputStructure() {
    return Frame::MakeRecord("NetqueueCount",
                             {Frame::StringField("NIC"), Frame::IntField("Tx netqueue count"),
                              Frame::IntField("Rx netqueue count")});
}

void NicQueueCountGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const bool named = input->HasParameter("vmnic");
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        auto list = Frame::MakeList(GetOutputStructure());
        Nic::ForEachNetqueue(
            named ? &name : nullptr, "Pnic with name " + name + " not found",
            [&](HostCtl::Network::Pnic& pnic, const HostCtl::Network::PnicNetqueueInfo& netqueue) {
                auto record = GetOutputStructure();
                record->SetField("NIC", pnic.GetName());
                record->SetField("Tx netqueue count", netqueue.txQueueCount);
                record->SetField("Rx netqueue count", netqueue.rxQueueCount);
                list->Add(record);
            });
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/ens/ens.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::NetworkInfo;

EnsLcoreList::EnsLcoreList() {
    Frame::Describe(*this,
                    {"List ENS contexts.", "fetcher", "table", {{"fields:Ens", "Lcore ID,Switch,Affinity"}}});
}

InputSpecPtr EnsLcoreList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr EnsLcoreList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr EnsLcoreList::GetOutputStructure() {
    return Frame::MakeRecord(
        "Ens", {Frame::IntField("Lcore ID"), Frame::StringField("Switch"), Frame::IntField("Affinity")});
}

void EnsLcoreList::ExecuteInternal(InputPtr, OutputPtr output) {
    // A failure on the way discards the partial list.
    Frame::HostCall(output, [&] {
        const std::vector<std::uint64_t> ids = NetworkInfo::GetLcoreList();
        auto list = Frame::MakeList(GetOutputStructure());
        list->Reserve(ids.size());
        for (std::uint64_t id : ids) {
            auto record = GetOutputStructure();
            record->SetField("Lcore ID", id);
            record->SetField("Switch", NetworkInfo::GetLcoreSwitch(id));
            record->SetField("Affinity", NetworkInfo::GetLcoreAffinity(id));
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/ip/ip.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/tknnic.h"

namespace TalvexCli::NetworkNamespace {

MulticastGroupList::MulticastGroupList() {
    Frame::Describe(*this, {"List all the multicast group members.",
                            "fetcher",
                            "table",
                            {{"fields:Interface", "Interface,Refcount,Group,Link Layer"}}});
}

InputSpecPtr MulticastGroupList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr MulticastGroupList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr MulticastGroupList::GetOutputStructure() {
    return Frame::MakeRecord("Nic", {Frame::StringField("Interface"), Frame::IntField("Refcount"),
                                     Frame::StringField("Group"), Frame::StringField("Link Layer")});
}

void MulticastGroupList::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, [&] {
        std::unique_ptr<HostCtl::Network::TarkonNicInfo> nicInfo;
        {
            auto host = HostCtl::HostFactory::GetHost();
            auto networkInfo = host->GetNetworkInfo();
            nicInfo = networkInfo->GetTarkonNicInfo();
        }
        auto list = Frame::MakeList(GetOutputStructure());
        const Frame::RecordMaker rows(GetOutputStructure());
        for (const auto& nic : nicInfo->GetTarkonNics()) {
            std::vector<HostCtl::Network::TknNic::MulticastGroup> groups;
            nic->GetMulticastGroups(groups);
            for (const auto& group : groups) {
                auto record = rows.New();
                record->SetField("Interface", group.interfaceName);
                record->SetField("Refcount", group.refCount);
                record->SetField("Group", group.groupAddress);
                record->SetField("Link Layer", group.linkLayerAddress);
                list->Add(record);
            }
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

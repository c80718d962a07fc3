#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchPortGroupList::VirtualSwitchPortGroupList() {
    Frame::Describe(*this, {"List all of the port groups currently on the system.",
                            "fetcher",
                            "table",
                            {{"fields:PortGroup", "Name,Virtual Switch,Active Clients,VLAN ID"}}});
}

InputSpecPtr VirtualSwitchPortGroupList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr VirtualSwitchPortGroupList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr VirtualSwitchPortGroupList::GetOutputStructure() {
    return Frame::MakeRecord("PortGroup", {Frame::StringField("Name"), Frame::StringField("Virtual Switch"),
                                           Frame::IntField("Active Clients"), Frame::IntField("VLAN ID")});
}

void VirtualSwitchPortGroupList::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, [&] {
        auto list = Frame::MakeList(GetOutputStructure());
        const Frame::RecordMaker rows(GetOutputStructure());
        TknCtl::Network::NetworkInfoImpl info;
        for (const auto& group : info.GetAllPortGroups()) {
            auto record = rows.New();
            record->SetField("Name", group->GetName());
            record->SetField("Virtual Switch", group->GetVirtualSwitchName());
            record->SetField("Active Clients", static_cast<long>(group->GetActiveClients()));
            record->SetField("VLAN ID", static_cast<long>(group->GetVlanId()));
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

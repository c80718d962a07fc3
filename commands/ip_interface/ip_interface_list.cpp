#include "commands/ip_interface/ip_interface.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::ConnectionPoint;

IpInterfaceList::IpInterfaceList() {
    Frame::Describe(*this,
                    {"This command will list the Tarkon network interfaces currently known to the system.",
                     "fetcher",
                     "simple",
                     {{"header:NetworkInterface", "%Name%"},
                      {"fields:NetworkInterface",
                       "Name,MAC Address,Enabled,Portset,Portgroup,Netstack Instance,QBR Name,QBR UUID,QBR "
                       "Port,QBR Connection,Opaque Network ID,Opaque Network Type,External ID,MTU,TSO "
                       "MSS,RXDispQueue Size,Port ID"}}});
}

InputSpecPtr IpInterfaceList::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"netstack", "N", Frame::kString,
          "The network stack instance; if unspecified, consider all netstack instances"}});
}

OutputSpecPtr IpInterfaceList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr IpInterfaceList::GetOutputStructure() {
    return Frame::MakeRecord(
        "NetworkInterface",
        {Frame::StringField("Name"), Frame::StringField("MAC Address"), Frame::StringField("Portset"),
         Frame::StringField("Portgroup"), Frame::StringField("Netstack Instance"),
         Frame::StringField("QBR Name"), Frame::StringField("QBR UUID"), Frame::StringField("QBR Port"),
         Frame::IntField("QBR Connection"), Frame::StringField("Opaque Network ID"),
         Frame::StringField("Opaque Network Type"), Frame::StringField("External ID"), Frame::IntField("MTU"),
         Frame::IntField("TSO MSS"), Frame::IntField("RXDispQueue Size"), Frame::BoolField("Enabled"),
         Frame::IntField("Port ID")});
}

namespace {

void SetQbrNotApplicable(const RecordPtr& record) {
    for (const char* field : {"QBR Name", "QBR UUID", "QBR Port"})
        record->SetField(field, "N/A");
    record->SetField("QBR Connection", -1);
}

void SetOpaqueNotApplicable(const RecordPtr& record) {
    for (const char* field : {"Opaque Network ID", "Opaque Network Type", "External ID"})
        record->SetField(field, "N/A");
}

}  // namespace

void IpInterfaceList::ExecuteInternal(InputPtr input, OutputPtr output) {
    auto list = Frame::MakeList(GetOutputStructure());
    const Frame::RecordMaker rows(GetOutputStructure());
    Frame::HostCall(output, [&] {
        TknCtl::Network::TarkonNicInfoImpl info;
        const std::string& netstack = input->GetParameter("netstack");
        auto nics = netstack.empty() ? info.GetTarkonNics() : info.GetTarkonNicsByInstanceKey(netstack);
        for (const auto& nic : nics) {
            auto record = rows.New();
            record->SetField("Name", nic->GetName());
            record->SetField("MAC Address", nic->GetMacAddress().GetStringAddress());

            auto point = nic->GetConnectionPoint();
            if (!point) {
                for (const char* field : {"Portset", "Portgroup", "Netstack Instance"})
                    record->SetField(field, "N/A");
                SetQbrNotApplicable(record);
                SetOpaqueNotApplicable(record);
            } else {
                std::string portset = point->GetPortsetName();
                record->SetField("Portset", portset.empty() ? std::string("N/A") : portset);
                switch (point->GetConnectionType()) {
                    case ConnectionPoint::TYPE_PORTGROUP:
                        record->SetField("Portgroup", point->GetPortGroupName());
                        record->SetField("Netstack Instance", nic->GetNetstackInstance());
                        SetQbrNotApplicable(record);
                        SetOpaqueNotApplicable(record);
                        break;
                    case ConnectionPoint::TYPE_DVPORT: {
                        auto param = point->GetDVPortParam();
                        record->SetField("QBR UUID", param.GetSwitchUuid());
                        record->SetField("QBR Port", param.GetPortId());
                        record->SetField("QBR Connection", static_cast<long>(param.GetConnectionId()));
                        record->SetField("Portgroup", "N/A");
                        record->SetField("Netstack Instance", nic->GetNetstackInstance());
                        TknCtl::Network::VirtualSwitchInfoImpl switches;
                        auto dvs = switches.GetDVSwitchByName(portset);
                        if (dvs) {
                            record->SetField("QBR Name", dvs->GetDvsName());
                        } else {
                            output->AddErrorMessage("Unable to access the associated QBR");
                            record->SetField("QBR Name", "N/A");
                        }
                        SetOpaqueNotApplicable(record);
                        break;
                    }
                    case ConnectionPoint::TYPE_OPAQUE_NETWORK: {
                        auto param = point->GetOpaqueNetworkParam();
                        record->SetField("Opaque Network ID", param.GetNetworkId());
                        record->SetField("Opaque Network Type", param.GetNetworkType());
                        record->SetField("External ID", param.GetExternalId());
                        record->SetField("Portgroup", "N/A");
                        SetQbrNotApplicable(record);
                        record->SetField("Netstack Instance", nic->GetNetstackInstance());
                        break;
                    }
                    default:
                        output->AddErrorMessage(
                            "Unknown ConnectionPoint type found in list of Tarkon network interfaces.");
                        break;
                }
            }

            record->SetField("MTU", nic->GetMtu());
            record->SetField("TSO MSS", nic->GetTsoMss());
            record->SetField("RXDispQueue Size", nic->GetRxDispQueueSize());
            record->SetField("Enabled", nic->IsEnabled());
            if (auto port = nic->GetPort()) record->SetField("Port ID", port->GetPortId());
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

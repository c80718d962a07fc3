#include "commands/ip_interface/ip_interface.h"

namespace TalvexCli::NetworkNamespace {

IpInterfaceIpv4Get::IpInterfaceIpv4Get() {
    Frame::Describe(*this,
                    {"List the IPv4 addresses assigned to Tarkon network interfaces.",
                     "fetcher",
                     "table",
                     {{"fields:IPv4Interface",
                       "Name,IPv4 Address,IPv4 Netmask,IPv4 Broadcast,Address Type,Gateway,DHCP DNS"}}});
}

InputSpecPtr IpInterfaceIpv4Get::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, consider all netstack instances"},
        {"interface-name", "i", Frame::kString,
         "The name of the Tarkon network interface to limit the output of this command to."},
    });
}

OutputSpecPtr IpInterfaceIpv4Get::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr IpInterfaceIpv4Get::GetOutputStructure() {
    return Frame::MakeRecord(
        "IPv4Interface",
        {Frame::StringField("Name"), Frame::StringField("IPv4 Address"), Frame::StringField("IPv4 Netmask"),
         Frame::StringField("IPv4 Broadcast"), Frame::StringField("Address Type"),
         Frame::StringField("Gateway"), Frame::BoolField("DHCP DNS")});
}

void IpInterfaceIpv4Get::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("interface-name");
    auto list = Frame::MakeList(GetOutputStructure());
    Frame::HostCall(output, "Error getting IPv4 configuration. . Error was : ", [&] {
        TknCtl::Network::TarkonNicInfoImpl info;
        std::vector<std::unique_ptr<HostCtl::Network::TknNic>> nics;
        if (!name.empty()) {
            auto nic = info.GetTarkonNicByInterface(name, false);
            if (!nic) {
                output->AddErrorMessage(IpInterface::kNoSuchInterface + name);
                return;
            }
            nics.push_back(std::move(nic));
        } else {
            const std::string& netstack = input->GetParameter("netstack");
            nics = netstack.empty() ? info.GetTarkonNics() : info.GetTarkonNicsByInstanceKey(netstack);
        }
        for (const auto& nic : nics) {
            HostCtl::Network::IpConfig config = nic->GetIpConfig();
            auto record = GetOutputStructure();
            record->SetField("Name", nic->GetName());
            record->SetField("IPv4 Address", config.GetIpv4Address().GetStringAddress());
            record->SetField("IPv4 Netmask", config.GetIpv4Netmask().GetStringAddress());
            record->SetField("IPv4 Broadcast", config.GetIpv4Broadcast().GetStringAddress());
            const char* type = config.GetUseDhcp() ? "DHCP" : config.GetIpv4UseNone() ? "NONE" : "STATIC";
            record->SetField("Address Type", type);
            record->SetField("Gateway", config.GetIpv4Gateway().GetStringAddress());
            record->SetField("DHCP DNS", config.GetUseDhcp() && nic->GetDnsIpConfig().GetDhcpDns());
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/ip_interface/ip_interface.h"

namespace TalvexCli::NetworkNamespace {

IpInterfaceIpv6Get::IpInterfaceIpv6Get() {
    Frame::Describe(
        *this,
        {"Get IPv6 settings for Tarkon network interfaces. This does not include the IPv6 "
         "addresses which can be found in the \"address list\" command.",
         "fetcher",
         "table",
         {{"fields:IPv6Interface", "Name,IPv6 Enabled,DHCPv6 Enabled,Router Adv Enabled,DHCP DNS,Gateway"}}});
}

InputSpecPtr IpInterfaceIpv6Get::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"interface-name", "n", Frame::kString,
         "The name of the Tarkon network interface to limit the output of this command to."},
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, consider all netstack instances"},
    });
}

OutputSpecPtr IpInterfaceIpv6Get::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr IpInterfaceIpv6Get::GetOutputStructure() {
    return Frame::MakeRecord("IPv6Interface",
                             {Frame::StringField("Name"), Frame::BoolField("IPv6 Enabled"),
                              Frame::BoolField("DHCPv6 Enabled"), Frame::BoolField("Router Adv Enabled"),
                              Frame::BoolField("DHCP DNS"), Frame::StringField("Gateway")});
}

void IpInterfaceIpv6Get::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("interface-name");
    auto list = Frame::MakeList(GetOutputStructure());
    Frame::HostCall(output, "Error getting IPv6 configuration. . Error was : ", [&] {
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
            bool dynamic = config.GetUseIpv6Dhcp() || config.GetUseIpv6RouterAdvertised();
            auto record = GetOutputStructure();
            record->SetField("Name", nic->GetName());
            record->SetField("IPv6 Enabled", config.GetUseIpv6());
            record->SetField("DHCPv6 Enabled", config.GetUseIpv6Dhcp());
            record->SetField("Router Adv Enabled", config.GetUseIpv6RouterAdvertised());
            record->SetField("DHCP DNS", dynamic && nic->GetDnsIpConfig().GetIpv6DhcpDns());
            record->SetField("Gateway", config.GetIpv6Gateway().GetStringAddress());
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

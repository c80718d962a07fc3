#include "commands/ip_interface/ip_interface.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::Ipv6Network;

IpInterfaceIpv6AddressList::IpInterfaceIpv6AddressList() {
    Frame::Describe(*this,
                    {"This command will list all of the IPv6 addresses currently assigned to the system",
                     "fetcher",
                     "table",
                     {{"fields:IPv6Interface", "Interface,Address,Netmask,Type,Status"}}});
}

InputSpecPtr IpInterfaceIpv6AddressList::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"interface-name", "i", Frame::kString,
          "The name of the Tarkon network interface to limit the output of this command to."}});
}

OutputSpecPtr IpInterfaceIpv6AddressList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr IpInterfaceIpv6AddressList::GetOutputStructure() {
    return Frame::MakeRecord("IPv6Interface", {Frame::StringField("Interface"), Frame::StringField("Address"),
                                               Frame::IntField("Netmask"), Frame::StringField("Type"),
                                               Frame::StringField("Status")});
}

namespace {

const char* TypeText(int origin) {
    switch (origin) {
        case Ipv6Network::ORIGIN_STATIC:
            return "STATIC";
        case Ipv6Network::ORIGIN_AUTOCONF:
            return "AUTOCONF";
        case Ipv6Network::ORIGIN_DHCP:
            return "DHCP";
        default:
            return "";
    }
}

const char* StatusText(int status) {
    switch (status) {
        case Ipv6Network::STATUS_TENTATIVE:
            return "TENTATIVE";
        case Ipv6Network::STATUS_DUPLICATED:
            return "DUPLICATED";
        case Ipv6Network::STATUS_DEPRECATED:
            return "DEPRECATED";
        default:
            return "PREFERRED";
    }
}

}  // namespace

void IpInterfaceIpv6AddressList::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("interface-name");
    auto list = Frame::MakeList(GetOutputStructure());
    Frame::HostCall(output, "Unable to list IPv6 Addresses. Error was: ", [&] {
        TknCtl::Network::TarkonNicInfoImpl info;
        std::vector<std::unique_ptr<HostCtl::Network::TknNic>> nics;
        if (name.empty()) {
            nics = info.GetTarkonNics();
        } else {
            auto nic = info.GetTarkonNicByInterface(name, false);
            if (!nic) {
                output->AddErrorMessage(IpInterface::kNoSuchInterface + name);
                return;
            }
            nics.push_back(std::move(nic));
        }
        for (const auto& nic : nics) {
            std::string nicName = nic->GetName();
            HostCtl::Network::IpConfig config = nic->GetIpConfig();
            for (const auto& network : config.GetIpv6Network()) {
                auto record = GetOutputStructure();
                record->SetField("Interface", nicName);
                record->SetField("Address", network.GetAddress().GetStringAddress());
                record->SetField("Netmask", network.GetNetmask());
                record->SetField("Type", TypeText(network.GetIpv6AddressType()));
                record->SetField("Status", StatusText(network.GetIpv6AddressStatus()));
                list->Add(record);
            }
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

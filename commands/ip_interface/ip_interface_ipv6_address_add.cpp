#include "commands/ip_interface/ip_interface.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::Ipv6Network;

IpInterfaceIpv6AddressAdd::IpInterfaceIpv6AddressAdd() {
    Frame::Describe(*this, {"Add a static IPv6 address to a given Tarkon network interface.", "operation"});
}

InputSpecPtr IpInterfaceIpv6AddressAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"interface-name", "i", Frame::kString,
         "The name of the Tarkon network interface to add a static IPv6 address to. This name must be an "
         "interface listed in the interface list command.",
         Frame::kRequired},
        {"ipv6", "I", Frame::kString,
         "The IPv6 address to add to the given Tarkon network interface. This must be in X:X:X::/X format",
         Frame::kRequired},
    });
}

OutputSpecPtr IpInterfaceIpv6AddressAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpInterfaceIpv6AddressAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("interface-name");
    const std::string& ipv6 = input->GetParameter("ipv6");
    if (!Ipv6Network::IsValidAddressAndNetmask(ipv6)) {
        output->AddErrorMessage(
            "Invalid format for IPv6 address. Address must be in the format <ipv6-address>/<prefix-length>   "
            "Example: 1:2:3:4::/64");
        return;
    }
    Frame::HostCall(output, "Error adding IPv6 address for the interface " + name + ". Error was : ", [&] {
        TknCtl::Network::TarkonNicInfoImpl info;
        auto nic = info.GetTarkonNicByInterface(name, false);
        if (!nic) {
            output->AddErrorMessage(IpInterface::kNoSuchInterface + name);
            return;
        }
        HostCtl::Network::IpConfig config = nic->GetIpConfig();
        config.AddIpv6Network(Ipv6Network(ipv6));
        nic->SetIpConfig(config);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/ip_interface/ip_interface.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::Ipv6Address;

IpInterfaceIpv6Set::IpInterfaceIpv6Set() {
    Frame::Describe(*this, {"Configure IPv6 settings for a given Tarkon network interface.", "operation"});
}

InputSpecPtr IpInterfaceIpv6Set::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"interface-name", "i", Frame::kString,
         "The name of the Tarkon network interface to set IPv6 settings for. This name must be an interface "
         "listed "
         "in the interface list command.",
         Frame::kRequired},
        {"enable-ipv6", "e", Frame::kBool,
         "Setting this value to true enables IPv6 on thisinterface while setting it to false disables IPv6 "
         "on this "
         "interface."},
        {"enable-dhcpv6", "d", Frame::kBool,
         "Setting this value to true will enable DHCPv6 on this interface and attempt to aquire an IPv6 "
         "address from "
         "the network "},
        {"enable-router-adv", "r", Frame::kBool,
         "Setting this value to true will enable IPv6 Router Advertised IPv6 addresses to be added to this "
         "interface "
         "from any routers broadcasting on the local network."},
        {"peer-dns", "P", Frame::kBool,
         "A boolean value to indicate if the system should use the DNS settings published via DHCPv6 for "
         "this "
         "interface."},
        {"gateway", "g", Frame::kString,
         "A default gateway for this interface. The value must be a valid IPv6 address."},
    });
}

OutputSpecPtr IpInterfaceIpv6Set::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpInterfaceIpv6Set::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("interface-name");
    Frame::HostCall(
        output, "Error changing IPv6 configuration for the interface " + name + ". Error was : ", [&] {
            TknCtl::Network::TarkonNicInfoImpl info;
            auto nic = info.GetTarkonNicByInterface(name, false);
            if (!nic) {
                output->AddErrorMessage(IpInterface::kNoSuchInterface + name);
                return;
            }
            HostCtl::Network::IpConfig config = nic->GetIpConfig();
            config.SetDhcpDns(nic->GetDnsIpConfig().GetDhcpDns());

            if (input->HasParameter("enable-dhcpv6"))
                config.SetUseIpv6Dhcp(input->GetParameterBool("enable-dhcpv6"));
            if (input->HasParameter("enable-router-adv"))
                config.SetUseIpv6RouterAdvertised(input->GetParameterBool("enable-router-adv"));
            bool dynamic = config.GetUseIpv6Dhcp() || config.GetUseIpv6RouterAdvertised();

            if (input->HasParameter("peer-dns")) {
                bool peerDns = input->GetParameterBool("peer-dns");
                if (dynamic) {
                    config.SetIpv6DhcpDns(peerDns);
                } else if (peerDns) {
                    output->AddErrorMessage("-P|--peer-dns can be specified only if DHCPv6 or RA is enabled");
                    return;
                }
            }
            if (input->HasParameter("enable-ipv6")) config.SetUseIpv6(input->GetParameterBool("enable-ipv6"));

            if (!input->HasParameter("gateway")) {
                config.SetIpv6Gateway(Ipv6Address());
            } else {
                const std::string& gateway = input->GetParameter("gateway");
                if (dynamic) {
                    output->AddErrorMessage(
                        "Cannot set an interface gateway when DHCP/Router Advertisement is enabled.");
                    return;
                }
                if (!Ipv6Address::IsValidAddress(gateway)) {
                    output->AddErrorMessage(
                        "Invalid --gateway option provided.This address is not a valid IPv6 address");
                    return;
                }
                config.SetIpv6Gateway(Ipv6Address(gateway));
            }
            nic->SetIpConfig(config);
            Frame::SetResult(output, true);
        });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/ip_interface/ip_interface.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::Ipv4Address;

IpInterfaceIpv4Set::IpInterfaceIpv4Set() {
    Frame::Describe(*this, {"Configure IPv4 setting for a given Tarkon network interface.", "operation"});
}

InputSpecPtr IpInterfaceIpv4Set::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"interface-name", "i", Frame::kString,
         "The name of the Tarkon network interface to set IPv4 settings for. This name must be an interface "
         "listed "
         "in the interface list command.",
         Frame::kRequired},
        {"type", "t", Frame::kString, "IPv4 Address type : %FULLENUM%", Frame::kOptional,
         Frame::StringEnum({
             {"static",
              "Set Static IPv4 information for this interface. Requires --ipv4 and --netmask options."},
             {"dhcp", "Use DHCP to aquire IPv4 setting for this interface."},
             {"none", "Remove IPv4 settings form this interface."},
         })},
        {"ipv4", "I", Frame::kString, "The static IPv4 address for this interface."},
        {"netmask", "N", Frame::kString, "The static IPv4 netmask for this interface."},
        {"gateway", "g", Frame::kString,
         "The default gateway for this interface. The value must be a valid IPv4 address. Gateway would be "
         "reset if "
         "not provided"},
        {"peer-dns", "P", Frame::kBool,
         "A boolean value to indicate if the system should use the DNS settings published via DHCPv4 for "
         "this "
         "interface."},
    });
}

OutputSpecPtr IpInterfaceIpv4Set::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpInterfaceIpv4Set::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("interface-name");
    Frame::HostCall(
        output, "Error changing IPv4 configuration for the interface " + name + ". Error was : ", [&] {
            TknCtl::Network::TarkonNicInfoImpl info;
            auto nic = info.GetTarkonNicByInterface(name, false);
            if (!nic) {
                output->AddErrorMessage(IpInterface::kNoSuchInterface + name);
                return;
            }
            HostCtl::Network::IpConfig config = nic->GetIpConfig();
            config.SetIpv6DhcpDns(nic->GetDnsIpConfig().GetIpv6DhcpDns());

            bool hasAddress = input->HasParameter("ipv4");
            bool hasGateway = input->HasParameter("gateway");
            if (input->HasParameter("type")) {
                const std::string& type = input->GetParameter("type");
                if (type == "static") {
                    const std::string& ipv4 = input->GetParameter("ipv4");
                    const std::string& netmask = input->GetParameter("netmask");
                    std::string gateway = "0.0.0.0";
                    bool valid = true;
                    if (ipv4.empty() || netmask.empty()) {
                        output->AddErrorMessage(
                            "The --type=static requires the --ipv4 and --netmask options.");
                        valid = false;
                    }
                    if (!Ipv4Address::IsValidAddress(ipv4)) {
                        output->AddErrorMessage(
                            "Invalid --ipv4 option provided. This address is not a valid IPv4 address");
                        valid = false;
                    }
                    if (!Ipv4Address::IsValidAddress(netmask)) {
                        output->AddErrorMessage(
                            "Invalid --netmask option provided. This address is not a valid IPv4 address");
                        valid = false;
                    }
                    if (hasGateway) {
                        gateway = input->GetParameter("gateway");
                        if (!Ipv4Address::IsValidAddress(gateway)) {
                            output->AddErrorMessage(
                                "Invalid --gateway option provided. This address is not a valid IPv4 "
                                "address");
                            return;
                        }
                    }
                    if (!valid) return;
                    config.SetIpv4Address(Ipv4Address(ipv4));
                    config.SetIpv4Netmask(Ipv4Address(netmask));
                    config.SetIpv4Gateway(Ipv4Address(gateway));
                } else {
                    if (hasAddress || hasGateway) {
                        output->AddErrorMessage(
                            "-I|--ipv4 or -g|--gateway can be specified only if type is static");
                        return;
                    }
                    if (type == "dhcp") {
                        config.SetUseDhcp(true);
                    } else {
                        config.SetIpv4UseNone();
                    }
                }
            } else if (hasAddress || hasGateway) {
                output->AddErrorMessage(
                    "-I|--ipv4 or -g|--gateway can be specified only if type is specified");
                return;
            }

            if (input->HasParameter("peer-dns")) {
                bool peerDns = input->GetParameterBool("peer-dns");
                if (config.GetUseDhcp()) {
                    config.SetDhcpDns(peerDns);
                } else if (peerDns) {
                    output->AddErrorMessage("-P|--peer-dns can be specified only if DHCP is enabled");
                    return;
                }
            }
            nic->SetIpConfig(config);
            Frame::SetResult(output, true);
        });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/tknnic.h"

namespace TalvexCli::NetworkNamespace {

IpNeighborRemove::IpNeighborRemove() {
    Frame::Describe(*this, {"Remove ARP table entries", "operation"});
}

InputSpecPtr IpNeighborRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"version", "v", Frame::kString, "IP version : %ENUM%", Frame::kRequired,
         Frame::StringEnum({{"4", ""}, {"6", ""}})},
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, use the default netstack instance"},
        {"interface-name", "i", Frame::kString,
         "The name of the Tarkon network interface to remove the neighbor entry from. If not specified, "
         "neighbor "
         "will be removed from all interfaces"},
        {"neighbor-addr", "a", Frame::kString, "The IPv4/IPv6 address of the neighbor.", Frame::kRequired},
    });
}

OutputSpecPtr IpNeighborRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpNeighborRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("interface-name");
    const std::string& version = input->GetParameter("version");
    const std::string& address = input->GetParameter("neighbor-addr");
    Frame::HostCall(output, [&] {
        std::string netstack = Frame::Netstack(*input);
        if (!name.empty()) {
            TknCtl::Network::TarkonNicInfoImpl info;
            auto nic = info.GetTarkonNicByInterface(name, false);
            if (!nic) {
                output->AddErrorMessage("Unable to find a Tarkon interface with the name " + name);
                return;
            }
            netstack = nic->GetNetstackInstance();
        }
        TknCtl::Network::RoutingInfoImpl routing(Frame::kDefaultNetstack);
        routing.SetNetstackInstanceKey(netstack);
        if (version == "4") {
            HostCtl::Network::Ipv4Neighbor neighbor;
            neighbor.address = HostCtl::Network::Ipv4Address(address);
            neighbor.interfaceName = name;
            routing.RemoveIpv4Neighbor(neighbor);
        } else {
            TknCtl::Network::NetworkInfoImpl networkInfo;
            if (networkInfo.IsTknIpv6Enabled()) {
                HostCtl::Network::Ipv6Neighbor neighbor;
                neighbor.address = HostCtl::Network::Ipv6Address(address);
                neighbor.interfaceName = name;
                routing.RemoveIpv6Neighbor(neighbor);
            }
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

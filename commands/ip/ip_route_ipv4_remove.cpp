#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::Ipv4Address;
using HostCtl::Network::Ipv4Network;
using TknCtl::Network::RoutingInfoImpl;

IpRouteIpv4Remove::IpRouteIpv4Remove() {
    Frame::Describe(*this, {"Remove IPv4 route", "operation"});
}

InputSpecPtr IpRouteIpv4Remove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"network", "n", Frame::kString,
         "The Ipv4 address and prefix length of the network to remove the route from. Specify 'default' to "
         "indicate "
         "the default network.",
         Frame::kRequired},
        {"gateway", "g", Frame::kString,
         "The Ipv4 address of the gateway through which a route to be removed", Frame::kRequired},
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, use the default netstack instance"},
    });
}

OutputSpecPtr IpRouteIpv4Remove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpRouteIpv4Remove::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        RoutingInfoImpl routing(Frame::kDefaultNetstack);
        const std::string& netstack = input->GetParameter("netstack");
        if (!netstack.empty()) routing.SetNetstackInstanceKey(netstack);
        Ipv4Address gateway(input->GetParameter("gateway"));
        Ipv4Network network;
        const std::string& text = input->GetParameter("network");
        network = text == "default" ? RoutingInfoImpl::DEFAULT_IPV4_ROUTE : Ipv4Network(text);

        if (network == RoutingInfoImpl::DEFAULT_IPV4_ROUTE) {
            if (gateway != routing.GetTarkonDefaultGateway() &&
                gateway != routing.GetTarkonConfigDefaultGateway()) {
                output->AddErrorMessage(gateway.GetStringAddress() + " is not a default route.");
                return;
            }
            routing.SetTarkonDefaultGateway(Ipv4Address("0.0.0.0"), false);
        } else {
            routing.RemoveTarkonRoute(network, gateway);
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

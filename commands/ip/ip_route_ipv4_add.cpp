#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"

namespace TalvexCli::NetworkNamespace {

using TknCtl::Network::RoutingInfoImpl;

IpRouteIpv4Add::IpRouteIpv4Add() {
    Frame::Describe(*this, {"Add IPv4 route to the Tarkon.", "operation"});
}

InputSpecPtr IpRouteIpv4Add::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"network", "n", Frame::kString,
         "The Ipv4 address and prefix length of the network to add the route to. Specify 'default' to "
         "indicate the default network.",
         Frame::kRequired},
        {"gateway", "g", Frame::kString, "The Ipv4 address of the gateway through which a route to be added.",
         Frame::kRequired},
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, use the default netstack instance"},
    });
}

OutputSpecPtr IpRouteIpv4Add::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpRouteIpv4Add::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        RoutingInfoImpl routing(Frame::kDefaultNetstack);
        const std::string& netstack = input->GetParameter("netstack");
        if (!netstack.empty()) routing.SetNetstackInstanceKey(netstack);
        HostCtl::Network::Ipv4Address gateway(input->GetParameter("gateway"));
        const std::string& text = input->GetParameter("network");
        HostCtl::Network::Ipv4Network network =
            text == "default" ? RoutingInfoImpl::DEFAULT_IPV4_ROUTE : HostCtl::Network::Ipv4Network(text);
        routing.AddTarkonRoute(network, gateway);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

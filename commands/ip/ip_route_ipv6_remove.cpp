#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::Ipv6Address;
using HostCtl::Network::Ipv6Network;
using TknCtl::Network::RoutingInfoImpl;

IpRouteIpv6Remove::IpRouteIpv6Remove() {
    Frame::Describe(*this, {"Remove IPv6 route from the Tarkon", "operation"});
}

InputSpecPtr IpRouteIpv6Remove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"network", "n", Frame::kString,
         "The Ipv6 address and prefix length of the network to remove the route from. Specify 'default' to "
         "indicate "
         "the default network.",
         Frame::kRequired},
        {"gateway", "g", Frame::kString,
         "The Ipv6 address of the gateway through which a route to be removed", Frame::kRequired},
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, use the default netstack instance"},
    });
}

OutputSpecPtr IpRouteIpv6Remove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpRouteIpv6Remove::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        RoutingInfoImpl routing(Frame::kDefaultNetstack);
        Ipv6Address gateway(input->GetParameter("gateway"));
        Ipv6Network network;
        const std::string& text = input->GetParameter("network");
        network = text == "default" ? RoutingInfoImpl::DEFAULT_IPV6_ROUTE : Ipv6Network(text);
        const std::string& netstack = input->GetParameter("netstack");
        if (!netstack.empty()) routing.SetNetstackInstanceKey(netstack);

        if (network == RoutingInfoImpl::DEFAULT_IPV6_ROUTE) {
            if (gateway != routing.GetIpv6TarkonDefaultGateway() &&
                gateway != routing.GetIpv6TarkonConfigDefaultGateway()) {
                output->AddErrorMessage(gateway.GetStringAddress() + " is not a default route.");
                return;
            }
            routing.SetIpv6TarkonDefaultGateway(Ipv6Address());
        } else {
            routing.RemoveIpv6TarkonRoute(network, gateway);
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

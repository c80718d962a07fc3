#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"

namespace TalvexCli::NetworkNamespace {

using TknCtl::Network::RoutingInfoImpl;

IpRouteIpv6List::IpRouteIpv6List() {
    Frame::Describe(*this, {"List configured IPv6 routes",
                            "fetcher",
                            "table",
                            {{"fields:Ipv6Route", "Network,Netmask,Gateway,Interface"}}});
}

InputSpecPtr IpRouteIpv6List::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"netstack", "N", Frame::kString,
          "The network stack instance; if unspecified, use the default netstack instance"}});
}

OutputSpecPtr IpRouteIpv6List::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr IpRouteIpv6List::GetOutputStructure() {
    return Frame::MakeRecord("Ipv6Route", {Frame::StringField("Network"), Frame::StringField("Netmask"),
                                           Frame::StringField("Gateway"), Frame::StringField("Interface")});
}

void IpRouteIpv6List::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        RoutingInfoImpl routing(Frame::kDefaultNetstack);
        const std::string& netstack = input->GetParameter("netstack");
        if (!netstack.empty()) routing.SetNetstackInstanceKey(netstack);
        auto list = Frame::MakeList(GetOutputStructure());
        const Frame::RecordMaker rows(GetOutputStructure());
        for (const auto& route : routing.GetCurrentIpv6TarkonRoutes()) {
            auto record = rows.New();
            record->SetField("Netmask",
                             HostCtl::Network::Ipv6Network::NetmaskFromNumber(route.network.GetNetmask())
                                 .GetStringAddress());
            record->SetField("Interface", route.interfaceName);
            record->SetField("Network", route.network == RoutingInfoImpl::DEFAULT_IPV6_ROUTE
                                            ? std::string("default")
                                            : route.network.GetAddress().GetStringAddress());
            record->SetField("Gateway", route.gateway.GetStringAddress());
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"

namespace TalvexCli::NetworkNamespace {

using TknCtl::Network::RoutingInfoImpl;

IpRouteIpv4List::IpRouteIpv4List() {
    Frame::Describe(*this, {"List configured IPv4 routes",
                            "fetcher",
                            "table",
                            {{"fields:Ipv4Route", "Network,Netmask,Gateway,Interface,Source"}}});
}

InputSpecPtr IpRouteIpv4List::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"netstack", "N", Frame::kString,
          "The network stack instance; if unspecified, use the default netstack instance"}});
}

OutputSpecPtr IpRouteIpv4List::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr IpRouteIpv4List::GetOutputStructure() {
    return Frame::MakeRecord("Ipv4Route", {Frame::StringField("Network"), Frame::StringField("Netmask"),
                                           Frame::StringField("Gateway"), Frame::StringField("Interface"),
                                           Frame::StringField("Source")});
}

void IpRouteIpv4List::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        RoutingInfoImpl routing(Frame::kDefaultNetstack);
        const std::string& netstack = input->GetParameter("netstack");
        if (!netstack.empty()) routing.SetNetstackInstanceKey(netstack);
        auto list = Frame::MakeList(GetOutputStructure());
        const Frame::RecordMaker rows(GetOutputStructure());
        for (const auto& route : routing.GetCurrentTarkonRoutes()) {
            auto record = rows.New();
            record->SetField("Netmask", route.network.GetNetmask().GetStringAddress());
            record->SetField("Interface", route.interfaceName);
            record->SetField("Network", route.network == RoutingInfoImpl::DEFAULT_IPV4_ROUTE
                                            ? std::string("default")
                                            : route.network.GetNetwork().GetStringAddress());
            record->SetField("Gateway", route.gateway.GetStringAddress());
            record->SetField("Source", routing.GetDefaultGatewaySource(route.network));
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

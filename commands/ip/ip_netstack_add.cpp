#include "commands/ip/ip.h"
#include "hostctl/network/netstack.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

IpNetstackInstanceAdd::IpNetstackInstanceAdd() {
    Frame::Describe(*this, {"Add a new Netstack Instance.", "operation"});
}

InputSpecPtr IpNetstackInstanceAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"netstack", "N", Frame::kString, "The network stack instance", Frame::kRequired},
        {"disabled", "d", Frame::kFlag,
         "Create the netstack instance only in config i.e. in disabled state. Does not create in kernel."},
    });
}

OutputSpecPtr IpNetstackInstanceAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpNetstackInstanceAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& key = input->GetParameter("netstack");
    Frame::HostCall(output, "Unable to add Netstack Instance. Error was : ", [&] {
        TknCtl::Network::NetworkInfoImpl info;
        // A new netstack: 11000 connections, "newreno", IPv6 on, a TCP/IP stack.
        TknCtl::Network::NetstackInstanceImpl instance(key, 11000, "newreno", true, 2);
        info.AddNetstackInstance(&instance, input->IsFlagSet("disabled"));
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

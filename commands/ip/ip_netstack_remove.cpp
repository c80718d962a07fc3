#include "commands/ip/ip.h"
#include "hostctl/network/netstack.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

IpNetstackInstanceRemove::IpNetstackInstanceRemove() {
    Frame::Describe(*this, {"Remove a new Netstack Instance.", "operation"});
}

InputSpecPtr IpNetstackInstanceRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"netstack", "N", Frame::kString, "The network stack instance", Frame::kRequired},
    });
}

OutputSpecPtr IpNetstackInstanceRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpNetstackInstanceRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& key = input->GetParameter("netstack");
    Frame::HostCall(output, "Unable to Remove Netstack Instance. Error was : ", [&] {
        TknCtl::Network::NetworkInfoImpl info;
        info.RemoveNetstackInstance(key, false);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

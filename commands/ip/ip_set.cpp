#include "commands/ip/ip.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

IpSet::IpSet() {
    Frame::Describe(*this, {"Update global IP settings", "operation"});
}

InputSpecPtr IpSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"ipv6-enabled", "e", Frame::kBool, "Enable or disable IPv6 (Reboot Required)"}});
}

OutputSpecPtr IpSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        if (input->HasParameter("ipv6-enabled")) {
            TknCtl::Network::NetworkInfoImpl networkInfo;
            networkInfo.SetTknIpv6Enabled(input->GetParameterBool("ipv6-enabled"));
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

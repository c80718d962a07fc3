#include "commands/ip/ip.h"
#include "hostctl/network/ipsec.h"

namespace TalvexCli::NetworkNamespace {

IpIpsecSPRemove::IpIpsecSPRemove() {
    Frame::Describe(*this, {"Operation to remove Security Policy", "operation"});
}

InputSpecPtr IpIpsecSPRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"sp-name", "n", Frame::kString, "Name for the Security Policy to be removed."},
        {"remove-all", "a", Frame::kFlag, "Set to remove all Security Policys"},
    });
}

OutputSpecPtr IpIpsecSPRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpIpsecSPRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    const bool hasName = input->HasParameter("sp-name");
    const bool all = input->IsFlagSet("remove-all");
    if (hasName == all) {
        output->AddErrorMessage("You should specify exactly one of : --remove-all, --sp-name");
        return;
    }
    Frame::HostCall(output, [&] {
        TknCtl::Network::IpSecConfigImpl ipsec;
        if (hasName) {
            ipsec.RemoveSPDConfig(input->GetParameter("sp-name"));
        } else {
            ipsec.FlushSPDConfig();
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

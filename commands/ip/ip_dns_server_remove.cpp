#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"

namespace TalvexCli::NetworkNamespace {

IpDNSServerRemove::IpDNSServerRemove() {
    Frame::Describe(
        *this, {"Remove a DNS server from the list of DNS servers to use for this Hadro host.", "operation"});
}

InputSpecPtr IpDNSServerRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, use the default netstack instance"},
        {"all", "a", Frame::kFlag, " "},
        {"server", "s", Frame::kString, " "},
    });
}

OutputSpecPtr IpDNSServerRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpDNSServerRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::Network::DnsConfigImpl dns(Frame::Netstack(*input));
        if (input->IsFlagSet("all")) {
            dns.RemoveNameServers();
        } else if (!input->HasParameter("server")) {
            output->AddErrorMessage("You must specify exactly one of: --all, --server");
            return;
        } else {
            auto server = IpServices::DnsServerAddress(input->GetParameter("server"), output);
            if (!server) return;
            dns.RemoveNameServer(*server);
        }
        dns.SaveConfig();
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"

namespace TalvexCli::NetworkNamespace {

IpDNSSearchRemove::IpDNSSearchRemove() {
    Frame::Describe(*this, {"Remove a search domain from the list of domains to be searched when trying to "
                            "resolve an host name on the Hadro host.",
                            "operation"});
}

InputSpecPtr IpDNSSearchRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, use the default netstack instance"},
        {"domain", "d", Frame::kString,
         "The string name of a domain to remove from the list of search domains.", Frame::kRequired},
    });
}

OutputSpecPtr IpDNSSearchRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpDNSSearchRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::Network::DnsConfigImpl dns(Frame::Netstack(*input));
        dns.RemoveSearchDomain(input->GetParameter("domain"));
        dns.SaveConfig();
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

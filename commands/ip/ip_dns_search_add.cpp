#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"

namespace TalvexCli::NetworkNamespace {

IpDNSSearchAdd::IpDNSSearchAdd() {
    Frame::Describe(*this, {"Add a search domain to the list of domains to be searched when trying to "
                            "resolve an host name on the Hadro host.",
                            "operation"});
}

InputSpecPtr IpDNSSearchAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, use the default netstack instance"},
        {"domain", "d", Frame::kString, "The string name of a domain to add to the list of search domains.",
         Frame::kRequired},
    });
}

OutputSpecPtr IpDNSSearchAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpDNSSearchAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::Network::DnsConfigImpl dns(Frame::Netstack(*input));
        dns.AddSearchDomain(input->GetParameter("domain"));
        dns.SaveConfig();
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

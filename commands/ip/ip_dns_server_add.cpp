#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"

namespace TalvexCli::NetworkNamespace {

IpDNSServerAdd::IpDNSServerAdd() {
    Frame::Describe(*this,
                    {"Add a new DNS server to the end of the list of DNS servers to use for this Hadro host.",
                     "operation"});
}

InputSpecPtr IpDNSServerAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, use the default netstack instance"},
        {"server", "s", Frame::kString,
         "The IP address (v4 or v6) of the DNS server to add to the DNS server list.", Frame::kRequired},
    });
}

OutputSpecPtr IpDNSServerAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpDNSServerAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::Network::DnsConfigImpl dns(Frame::Netstack(*input));
        auto server = IpServices::DnsServerAddress(input->GetParameter("server"), output);
        if (!server) return;
        dns.AddNameServer(*server);
        dns.SaveConfig();
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

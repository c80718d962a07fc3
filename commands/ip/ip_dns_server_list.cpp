#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"

namespace TalvexCli::NetworkNamespace {

IpDNSServerList::IpDNSServerList() {
    Frame::Describe(*this, {"Print a list of the DNS server currently configured on the system in the order "
                            "in which they will be used.",
                            "fetcher", "simple"});
}

InputSpecPtr IpDNSServerList::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"netstack", "N", Frame::kString,
          "The network stack instance; if unspecified, use the default netstack instance"}});
}

OutputSpecPtr IpDNSServerList::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr IpDNSServerList::GetOutputStructure() {
    return Frame::MakeRecord("NameServerList", {Frame::StringListField("DNS Servers")});
}

void IpDNSServerList::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::Network::DnsConfigImpl dns(Frame::Netstack(*input));
        if (dns.IsStale()) {
            dns.Refresh();
            dns.SetStale(false);
        }
        auto servers = Zorbel::MetaObj::MetaList::New(Zorbel::MetaObj::META_STRING);
        for (const auto& server : dns.GetNameServers())
            servers->Add(server);
        auto record = GetOutputStructure();
        record->SetField("DNS Servers", servers);
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/ip/ip.h"
#include "hostctl/misc.h"
#include "hostctl/network/ip.h"

namespace TalvexCli::NetworkNamespace {

IpDNSSearchList::IpDNSSearchList() {
    Frame::Describe(*this, {"List the search domains currently configured on the Hadro host in the order in "
                            "which they will be used when searching.",
                            "fetcher", "simple"});
}

InputSpecPtr IpDNSSearchList::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"netstack", "N", Frame::kString,
          "The network stack instance; if unspecified, use the default netstack instance"}});
}

OutputSpecPtr IpDNSSearchList::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr IpDNSSearchList::GetOutputStructure() {
    return Frame::MakeRecord("DNSSearchList", {Frame::StringListField("DNS Search Domains")});
}

void IpDNSSearchList::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::Network::DnsConfigImpl dns(Frame::Netstack(*input));
        std::vector<std::string> domains;
        HostCtl::Misc::StringTokenize(dns.GetSearchDomainsString(), domains, " ");
        auto list = Zorbel::MetaObj::MetaList::New(Zorbel::MetaObj::META_STRING);
        for (const auto& domain : domains)
            list->Add(domain);
        auto record = GetOutputStructure();
        record->SetField("DNS Search Domains", list);
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

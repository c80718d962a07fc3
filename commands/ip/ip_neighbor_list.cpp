#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/tknnic.h"

namespace TalvexCli::NetworkNamespace {

IpNeighborList::IpNeighborList() {
    Frame::Describe(*this, {"List ARP table entries",
                            "fetcher",
                            "table",
                            {{"fields:NetworkNeighbor", "Neighbor,Mac Address,Tknnic,Expiry,State,Type"},
                             {"units:NetworkNeighbor.Expiry", "sec"}}});
}

InputSpecPtr IpNeighborList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"version", "v", Frame::kString, "IP version : %ENUM%", Frame::kOptional,
         Frame::StringEnum({{"4", ""}, {"6", ""}, {"all", ""}})},
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, use the default netstack instance"},
        {"interface-name", "i", Frame::kString,
         "The name of the Tarkon network interface to limit the output of this command to; if unspecified, "
         "list "
         "neighbors on all interfaces."},
    });
}

OutputSpecPtr IpNeighborList::GetOutputSpecInternal() {
    auto list = Frame::MakeList(GetOutputStructure());
    list->Add(GetOutputStructure());
    auto spec = Zorbel::CallSpec::OutputSpec::New();
    spec->SetRootObject(list);
    return spec;
}

RecordPtr IpNeighborList::GetOutputStructure() {
    return Frame::MakeRecord(
        "NetworkNeighbor",
        {Frame::StringField("Neighbor"), Frame::StringField("Mac Address"), Frame::StringField("Tknnic"),
         Frame::IntField("Expiry"), Frame::StringField("State"), Frame::StringField("Type")});
}

void IpNeighborList::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("interface-name");
    std::string version =
        input->HasParameter("version") ? input->GetParameter("version") : std::string("all");
    Frame::HostCall(output, [&] {
        TknCtl::Network::RoutingInfoImpl routing(Frame::kDefaultNetstack);
        const std::string& netstack = input->GetParameter("netstack");
        if (!netstack.empty()) routing.SetNetstackInstanceKey(netstack);
        if (!name.empty()) {
            TknCtl::Network::TarkonNicInfoImpl info;
            if (!info.GetTarkonNicByInterface(name, false)) {
                output->AddErrorMessage("Unable to find a Tarkon interface with the name " + name);
                return;
            }
        }
        auto list = Frame::MakeList(GetOutputStructure());
        const Frame::RecordMaker rows(GetOutputStructure());
        auto add = [&](const auto& entry, const std::string& state, const std::string& type) {
            auto record = rows.New();
            record->SetField("Neighbor", entry.address.GetStringAddress());
            record->SetField("Mac Address", entry.linkLayerAddress);
            record->SetField("Tknnic", entry.interfaceName);
            record->SetField("Expiry", entry.expiry);
            record->SetField("State", state);
            record->SetField("Type", type);
            list->Add(record);
        };
        if (version == "4" || version == "all") {
            std::vector<HostCtl::Network::Ipv4Neighbor> entries;
            routing.GetCurrentIpv4TarkonNeighbors(entries, name);
            for (const auto& entry : entries)
                add(entry, "", routing.GetIpv4NeighborType(entry));
        }
        TknCtl::Network::NetworkInfoImpl networkInfo;
        if ((version == "6" || version == "all") && networkInfo.IsTknIpv6Enabled()) {
            std::vector<HostCtl::Network::Ipv6Neighbor> entries;
            routing.GetCurrentIpv6TarkonNeighbors(entries, name);
            for (const auto& entry : entries)
                add(entry, routing.GetIpv6NeighborState(entry), routing.GetIpv6NeighborType(entry));
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

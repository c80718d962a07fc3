#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicSoftwareList::NicSoftwareList() {
    Frame::Describe(
        *this, {"List software simulation settings of physical NICs currently installed and loaded on the "
                "system.",
                "fetcher",
                "table",
                {{"fields:Settings",
                  "NIC,IPv4 CSO,IPv4 TSO,Scatter Gather,Offset Based Offload,VXLAN Encap,Geneve Offload,"
                  "IPv6 TSO,IPv6 TSO Ext,IPv6 CSO,IPv6 CSO Ext,High DMA,Scatter Gather MP,VLAN Tagging,"
                  "VLAN Untagging"}}});
}

InputSpecPtr NicSoftwareList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({{"vmnic", "n", Frame::kStringList,
                                  "Limit the output to only the physical NICS with the specified names."}});
}

OutputSpecPtr NicSoftwareList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

namespace {

using Software = HostCtl::Network::PnicSoftwareSettings;

// The columns, in record order, with the switch each one shows.
const std::pair<const char*, bool Software::*> kColumns[] = {
    {"IPv4 CSO", &Software::ipv4Cso},         {"IPv4 TSO", &Software::ipv4Tso},
    {"Scatter Gather", &Software::sg},        {"Offset Based Offload", &Software::obo},
    {"VXLAN Encap", &Software::vxlanEncap},   {"Geneve Offload", &Software::geneveOffload},
    {"IPv6 TSO", &Software::ipv6Tso},         {"IPv6 TSO Ext", &Software::ipv6TsoExt},
    {"IPv6 CSO", &Software::ipv6Cso},         {"IPv6 CSO Ext", &Software::ipv6CsoExt},
    {"High DMA", &Software::highDma},         {"Scatter Gather MP", &Software::sgSpanPages},
    {"VLAN Tagging", &Software::vlanTagging}, {"VLAN Untagging", &Software::vlanUntagging},
};

}  // namespace

RecordPtr NicSoftwareList::GetOutputStructure() {
    std::vector<Frame::Field> fields{Frame::StringField("NIC")};
    for (const auto& [column, member] : kColumns)
        fields.push_back(Frame::StringField(column));
    return Frame::MakeRecord("Settings", fields);
}

void NicSoftwareList::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        std::vector<std::unique_ptr<HostCtl::Network::Pnic>> pnics;
        if (input->HasParameter("vmnic")) {
            std::vector<std::string> names;
            input->GetParameterList("vmnic", names);
            for (const auto& name : names) {
                auto pnic = info->GetPnicByName(name);
                if (!pnic) Frame::Fail("Can't find PNIC with name " + name);
                pnics.push_back(std::move(pnic));
            }
        } else {
            pnics = info->GetPnics();
        }
        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& pnic : pnics) {
            if (!pnic) continue;
            auto record = GetOutputStructure();
            record->SetField("NIC", pnic->GetName());
            try {
                Software settings;
                pnic->GetSoftwareSettings(settings);
                for (const auto& [column, member] : kColumns)
                    record->SetField(column, Nic::OnOff(settings.*member));
            } catch (const HostCtl::Lib::HostCtlException&) {
                for (const auto& [column, member] : kColumns)
                    record->SetField(column, "N/A");
            }
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

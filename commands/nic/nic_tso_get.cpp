#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicTsoGet::NicTsoGet() {
    Frame::Describe(
        *this,
        {"Get TCP segmentation offload settings", "fetcher", "table", {{"fields:TSOSettings", "NIC,Value"}}});
}

InputSpecPtr NicTsoGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({{"vmnic", "n", Frame::kString, "The name of pnic to get TSO settings"}});
}

OutputSpecPtr NicTsoGet::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicTsoGet::GetOutputStructure() {
    return Frame::MakeRecord("TSOSettings", {Frame::StringField("NIC"), Frame::StringField("Value")});
}

void NicTsoGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::Network::NetworkInfoImpl info;
        std::vector<std::unique_ptr<HostCtl::Network::Pnic>> pnics;
        if (input->HasParameter("vmnic")) {
            const std::string& name = input->GetParameter("vmnic");
            auto pnic = info.GetPnicByName(name);
            if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
            pnics.push_back(std::move(pnic));
        } else {
            pnics = info.GetPnics();
        }
        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& pnic : pnics) {
            if (!pnic) continue;
            auto record = GetOutputStructure();
            record->SetField("NIC", pnic->GetName());
            try {
                HostCtl::Network::PnicOffloadSettings settings;
                pnic->GetOffloadSettings(settings);
                record->SetField("Value", Nic::OnOff(settings.tso));
            } catch (const HostCtl::Lib::HostCtlException&) {
                record->SetField("Value", "N/A");
            }
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

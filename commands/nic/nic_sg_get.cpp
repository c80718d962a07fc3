#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicSgGet::NicSgGet() {
    Frame::Describe(
        *this,
        {"Get scatter-gather settings", "fetcher", "table", {{"fields:ScatterGatherSetting", "NIC,Value"}}});
}

InputSpecPtr NicSgGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"vmnic", "n", Frame::kString, "The name of pnic to get scatter-gather settings"}});
}

OutputSpecPtr NicSgGet::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicSgGet::GetOutputStructure() {
    return Frame::MakeRecord("ScatterGatherSetting",
                             {Frame::StringField("NIC"), Frame::StringField("Value")});
}

void NicSgGet::ExecuteInternal(InputPtr input, OutputPtr output) {
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
                record->SetField("Value", Nic::OnOff(settings.scatterGather));
            } catch (const HostCtl::Lib::HostCtlException&) {
                record->SetField("Value", "N/A");
            }
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

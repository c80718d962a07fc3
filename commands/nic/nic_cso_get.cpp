#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicCsoGet::NicCsoGet() {
    Frame::Describe(*this, {"Get checksum offload settings",
                            "fetcher",
                            "table",
                            {{"fields:CSOSettings", "NIC,RX Checksum Offload,TX Checksum Offload"}}});
}

InputSpecPtr NicCsoGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({{"vmnic", "n", Frame::kString, "The name of pnic to get CSO settings"}});
}

OutputSpecPtr NicCsoGet::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicCsoGet::GetOutputStructure() {
    return Frame::MakeRecord("CSOSettings",
                             {Frame::StringField("NIC"), Frame::StringField("RX Checksum Offload"),
                              Frame::StringField("TX Checksum Offload")});
}

void NicCsoGet::ExecuteInternal(InputPtr input, OutputPtr output) {
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
                record->SetField("RX Checksum Offload", Nic::OnOff(settings.rxChecksum));
                record->SetField("TX Checksum Offload", Nic::OnOff(settings.txChecksum));
            } catch (const HostCtl::Lib::HostCtlException&) {
                record->SetField("RX Checksum Offload", "N/A");
                record->SetField("TX Checksum Offload", "N/A");
            }
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

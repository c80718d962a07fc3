#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicPauseParamsList::NicPauseParamsList() {
    Frame::Describe(*this,
                    {"List pause parameters of all NICs",
                     "fetcher",
                     "table",
                     {{"fields:PauseParamsSettings",
                       "NIC,Pause Params Supported,Pause RX,Pause TX,Auto Negotiation,Auto Negotiation "
                       "Resolution Avail,RX Auto Negotiation Resolution,TX Auto Negotiation Resolution"}}});
}

InputSpecPtr NicPauseParamsList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({{"nic-name", "n", Frame::kString,
                                  "The name of the NIC whose pause parameters should be retrieved."}});
}

OutputSpecPtr NicPauseParamsList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicPauseParamsList::GetOutputStructure() {
    return Frame::MakeRecord(
        "PauseParamsSettings",
        {Frame::StringField("NIC"), Frame::BoolField("Pause Params Supported"),
         Frame::BoolField("Auto Negotiation"), Frame::BoolField("Pause RX"), Frame::BoolField("Pause TX"),
         Frame::BoolField("Auto Negotiation Resolution Avail"),
         Frame::BoolField("RX Auto Negotiation Resolution"),
         Frame::BoolField("TX Auto Negotiation Resolution")});
}

void NicPauseParamsList::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        std::vector<std::unique_ptr<HostCtl::Network::Pnic>> pnics;
        if (input->HasParameter("nic-name")) {
            const std::string& name = input->GetParameter("nic-name");
            auto pnic = info->GetPnicByName(name);
            if (!pnic) Frame::Fail("NIC with name " + name + " not found");
            pnics.push_back(std::move(pnic));
        } else {
            pnics = info->GetPnics();
        }
        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& pnic : pnics) {
            if (!pnic) continue;
            auto record = GetOutputStructure();
            record->SetField("NIC", pnic->GetName());
            HostCtl::Network::PnicPauseParams pause;
            try {
                pnic->GetPauseParams(pause);
            } catch (const HostCtl::Lib::HostCtlException&) {
                pause = HostCtl::Network::PnicPauseParams();  // shown as not supporting pause
            }
            const bool supported = pause.supported;
            const bool resolved = supported && pause.rxResolution != 0 && pause.txResolution != 0;
            record->SetField("Pause Params Supported", supported);
            record->SetField("Auto Negotiation", supported && pause.autoNegotiate);
            record->SetField("Pause RX", supported && pause.rx);
            record->SetField("Pause TX", supported && pause.tx);
            record->SetField("Auto Negotiation Resolution Avail", resolved);
            record->SetField("RX Auto Negotiation Resolution", resolved && pause.rxResolution == 1);
            record->SetField("TX Auto Negotiation Resolution", resolved && pause.txResolution == 1);
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

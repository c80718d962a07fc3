#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicCoalesceGet::NicCoalesceGet() {
    Frame::Describe(*this,
                    {"Get coalesce parameters",
                     "fetcher",
                     "table",
                     {{"fields:CoalesceParams",
                       "NIC,RX microseconds,RX maximum frames,TX microseconds,TX Maximum frames,Adaptive RX,"
                       "Adaptive TX,Sample interval seconds"}}});
}

InputSpecPtr NicCoalesceGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"vmnic", "n", Frame::kString, "The name of pnic to get coalesce parameters"}});
}

OutputSpecPtr NicCoalesceGet::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicCoalesceGet::GetOutputStructure() {
    return Frame::MakeRecord(
        "CoalesceParams", {Frame::StringField("NIC"), Frame::StringField("RX microseconds"),
                           Frame::StringField("RX maximum frames"), Frame::StringField("TX microseconds"),
                           Frame::StringField("TX Maximum frames"), Frame::StringField("Adaptive RX"),
                           Frame::StringField("Adaptive TX"), Frame::StringField("Sample interval seconds")});
}

void NicCoalesceGet::ExecuteInternal(InputPtr input, OutputPtr output) {
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
            const char* const fields[] = {"RX microseconds",        "RX maximum frames", "TX microseconds",
                                          "TX Maximum frames",      "Adaptive RX",       "Adaptive TX",
                                          "Sample interval seconds"};
            try {
                HostCtl::Network::PnicCoalesceParams params;
                pnic->GetCoalesceParams(params);
                const std::string values[] = {
                    std::to_string(params.rxUsecs),       std::to_string(params.rxMaxFrames),
                    std::to_string(params.txUsecs),       std::to_string(params.txMaxFrames),
                    params.adaptiveRx ? "On" : "Off",     params.adaptiveTx ? "On" : "Off",
                    std::to_string(params.sampleInterval)};
                for (std::size_t i = 0; i < std::size(fields); ++i)
                    record->SetField(fields[i], values[i]);
            } catch (const HostCtl::Lib::HostCtlException&) {
                for (const char* field : fields)
                    record->SetField(field, "N/A");
            }
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/dvs/dvs.h"

namespace TalvexCli::NetworkNamespace {

namespace {

const std::string kParamDvs = "dvs";

const std::string kRecord = "LACPStats";
const std::string kDvSwitch = "DVSwitch";
const std::string kNic = "NIC";
const std::string kLagId = "LAG ID";
const std::string kTxLacpdus = "Tx LACPDUs";
const std::string kTxErrors = "Tx Errors";
const std::string kRxLacpdus = "Rx LACPDUs";
const std::string kRxErrors = "Rx Errors";

}  // namespace

LacpGetStats::LacpGetStats() {
    Frame::Describe(*this, {"Get LACP stats on DVS uplinks",
                            "fetcher",
                            "table",
                            {{"fields:LACP", "Uplink, Tx LACPDUs, Tx Errors, Rx LACPDUs, Rx Errors"}}});
}

InputSpecPtr LacpGetStats::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{kParamDvs, "s", Frame::kString, "The name of DVS to get configuration on"}});
}

OutputSpecPtr LacpGetStats::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr LacpGetStats::GetOutputStructure() {
    return Frame::MakeRecord(
        kRecord, {Frame::StringField(kDvSwitch), Frame::StringField(kNic), Frame::IntField(kLagId),
                  Frame::IntField(kTxLacpdus), Frame::IntField(kTxErrors), Frame::IntField(kRxLacpdus),
                  Frame::IntField(kRxErrors)});
}

void LacpGetStats::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        auto switches = Dvs::SelectLacpSwitches(*input);
        if (switches.empty()) {
            output->AddErrorMessage(
                "LACP is supported on Talvex DVSwitch only, and there is no DVSwitch configured on host.");
            return;
        }
        auto list = Frame::MakeList(GetOutputStructure());
        std::size_t lags = 0;
        std::size_t nics = 0;
        for (const auto& dvs : switches) {
            const std::string dvsName = dvs->GetDvsName();
            for (const auto& lag : dvs->GetLacpStatus()) {
                ++lags;
                for (const auto& member : lag.members) {
                    ++nics;
                    auto record = GetOutputStructure();
                    record->SetField(kDvSwitch, dvsName);
                    record->SetField(kNic, member.nic);
                    record->SetField(kLagId, lag.lagId);
                    record->SetField(kTxLacpdus, member.txLacpdus);
                    record->SetField(kTxErrors, member.txErrors);
                    record->SetField(kRxLacpdus, member.rxLacpdus);
                    record->SetField(kRxErrors, member.rxErrors);
                    list->Add(record);
                }
            }
        }
        if (lags == 0) {
            output->AddErrorMessage("No running LACP group on the host.");
            return;
        }
        if (nics == 0) {
            output->AddErrorMessage("No pnic is connected to DVSwitch.");
            return;
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include <cstdio>

#include "commands/dvs/dvs.h"

namespace TalvexCli::NetworkNamespace {

namespace {

const std::string kParamDvs = "dvs";

const std::string kLag = "LAG";
const std::string kDvSwitch = "DVSwitch";
const std::string kLagId = "LAG ID";
const std::string kMode = "Mode";
const std::string kFlags = "Flags";
const std::string kNicList = "Nic List";

const std::string kNicStatus = "NicStatus";
const std::string kNic = "Nic";
const std::string kState = "State";
const std::string kLocalInformation = "Local Information";
const std::string kPartnerInformation = "Partner Information";

const std::string kLocalInfo = "LocalInfo";
const std::string kPartnerInfo = "PartnerInfo";
const std::string kPortState = "Port State";
const std::string kAdminKey = "Admin Key";
const std::string kOperKey = "Oper Key";
const std::string kPortPriority = "Port Priority";
const std::string kPortNumber = "Port Number";
const std::string kDeviceId = "Device ID";
const std::string kAge = "Age";

// The legend of the flags texts.
const std::vector<std::string> kFlagLegend = {
    "S - Device is sending Slow LACPDUs", "F - Device is sending fast LACPDUs",
    "A - Device is in active mode", "P - Device is in passive mode"};

// The bits of an LACP actor or partner state byte, bit 0 first.
const char* const kStateBits[] = {"ACT", "FTO", "AGG", "SYN", "COL", "DIST", "DEF", "EXP"};

// The names of the set bits of a state byte, bit 0 upward, each followed by a comma.
std::string LacpStateText(std::uint8_t state) {
    std::string text;
    for (int bit = 0; bit < 8; ++bit) {
        if (state & (1u << bit)) {
            text += kStateBits[bit];
            text += ',';
        }
    }
    return text;
}

// Seconds as hours:minutes:seconds, each at least two digits.
std::string LacpAgeText(std::uint32_t seconds) {
    char text[32];
    std::snprintf(text, sizeof text, "%02u:%02u:%02u", static_cast<unsigned>(seconds / 3600),
                  static_cast<unsigned>(seconds / 60 % 60), static_cast<unsigned>(seconds % 60));
    return text;
}

}  // namespace

LacpGetStatus::LacpGetStatus() {
    Frame::Describe(
        *this,
        {"Get LACP status on DVS",
         "fetcher",
         "simple",
         {{"header:" + kLag, "%" + kDvSwitch + "%"},
          {"header:" + kNicStatus, "<NONE>"},
          {"header:" + kLocalInfo, "<NONE>"},
          {"header:" + kPartnerInfo, "<NONE>"},
          {"table-columns:" + kLag, "DVSwitch,LAG ID,Mode,Age,Flags,Nic List"},
          {"table-columns:" + kNicStatus, "Nic,State,Local Information,Partner Information"},
          {"table-columns:" + kLocalInfo, "Flags,Admin Key,Oper Key,Port Priority,Port Number,Port State"},
          {"table-columns:" + kPartnerInfo,
           "Device ID,Age,Flags,Oper Key,Port Priority,Port Number,Port State"}}});
}

InputSpecPtr LacpGetStatus::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{kParamDvs, "s", Frame::kString, "The name of DVS to get configuration on"}});
}

OutputSpecPtr LacpGetStatus::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr LacpGetStatus::GetOutputStructure() {
    return Frame::MakeRecord(
        kLag, {Frame::StringField(kDvSwitch), Frame::IntField(kLagId), Frame::StringField(kMode),
               Frame::StringListField(kFlags), Frame::RecordListField(kNicList, GetLACPNicInfoStruct())});
}

RecordPtr LacpGetStatus::GetLACPNicInfoStruct() {
    return Frame::MakeRecord(kNicStatus,
                             {Frame::StringField(kNic), Frame::StringField(kState),
                              Frame::RecordField(kLocalInformation, GetLACPLocalInfoStruct()),
                              Frame::RecordField(kPartnerInformation, GetLACPPartnerInfoStruct())});
}

RecordPtr LacpGetStatus::GetLACPLocalInfoStruct() {
    return Frame::MakeRecord(kLocalInfo, {Frame::StringField(kPortState), Frame::StringField(kFlags),
                                          Frame::IntField(kAdminKey), Frame::IntField(kOperKey),
                                          Frame::IntField(kPortPriority), Frame::IntField(kPortNumber)});
}

RecordPtr LacpGetStatus::GetLACPPartnerInfoStruct() {
    return Frame::MakeRecord(kPartnerInfo,
                             {Frame::StringField(kDeviceId), Frame::StringField(kPortState),
                              Frame::StringField(kFlags), Frame::StringField(kAge), Frame::IntField(kOperKey),
                              Frame::IntField(kPortPriority), Frame::IntField(kPortNumber)});
}

void LacpGetStatus::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        auto switches = Dvs::SelectLacpSwitches(*input);
        if (switches.empty()) {
            output->AddErrorMessage(
                "LACP is supported on Talvex DVSwitch only, and there is no DVSwitch configured on host.");
            return;
        }
        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& dvs : switches) {
            const std::string dvsName = dvs->GetDvsName();
            for (const auto& lag : dvs->GetLacpStatus()) {
                auto nics = Frame::MakeList(GetLACPNicInfoStruct());
                for (const auto& member : lag.members) {
                    auto local = GetLACPLocalInfoStruct();
                    local->SetField(kPortState, LacpStateText(member.actorState));
                    local->SetField(kFlags, member.actorFlags);
                    local->SetField(kAdminKey, member.actorAdminKey);
                    local->SetField(kOperKey, member.actorOperKey);
                    local->SetField(kPortPriority, member.actorPortPriority);
                    local->SetField(kPortNumber, member.actorPortNumber);

                    auto partner = GetLACPPartnerInfoStruct();
                    partner->SetField(kPortState, LacpStateText(member.partnerState));
                    partner->SetField(kFlags, member.partnerFlags);
                    partner->SetField(kDeviceId, member.partnerDeviceId);
                    partner->SetField(kAge, LacpAgeText(member.age));
                    partner->SetField(kOperKey, member.partnerOperKey);
                    partner->SetField(kPortPriority, member.partnerPortPriority);
                    partner->SetField(kPortNumber, member.partnerPortNumber);

                    auto nic = GetLACPNicInfoStruct();
                    nic->SetField(kNic, member.nic);
                    nic->SetField(kState, member.state);
                    nic->SetField(kLocalInformation, local);
                    nic->SetField(kPartnerInformation, partner);
                    nics->Add(nic);
                }
                auto record = GetOutputStructure();
                record->SetField(kDvSwitch, dvsName);
                record->SetField(kLagId, lag.lagId);
                record->SetField(kMode, lag.mode == 2 ? "Passive" : "Active");
                record->SetField(kFlags, kFlagLegend);
                record->SetField(kNicList, nics);
                list->Add(record);
            }
        }
        if (list->Size() == 0) {
            output->AddErrorMessage("No running LACP group on the host.");
            return;
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include <cstdlib>

#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

namespace {

using Stats = HostCtl::Network::SriovNicVFStats;

// The counters, in record order.
const std::pair<const char*, std::uint64_t Stats::*> kCounters[] = {
    {"Rx Unicast Pkt", &Stats::rxUnicastPkts},
    {"Rx Unicast Bytes", &Stats::rxUnicastBytes},
    {"Rx Multicast Pkts", &Stats::rxMulticastPkts},
    {"Rx Multicast Bytes", &Stats::rxMulticastBytes},
    {"Rx Broadcast Pkts", &Stats::rxBroadcastPkts},
    {"Rx Broadcast Bytes", &Stats::rxBroadcastBytes},
    {"Rx Out of Buffer drops", &Stats::rxOutOfBufferDrops},
    {"Rx Error drops", &Stats::rxErrorDrops},
    {"Rx LRO Pkts", &Stats::rxLroPkts},
    {"Rx LRO Bytes", &Stats::rxLroBytes},
    {"Tx Unicast Pkt", &Stats::txUnicastPkts},
    {"Tx Unicast Bytes", &Stats::txUnicastBytes},
    {"Tx Multicast Pkts", &Stats::txMulticastPkts},
    {"Tx Multicast Bytes", &Stats::txMulticastBytes},
    {"Tx Broadcast Pkts", &Stats::txBroadcastPkts},
    {"Tx Broadcast Bytes", &Stats::txBroadcastBytes},
    {"Tx Errors", &Stats::txErrors},
    {"Tx Discards", &Stats::txDiscards},
    {"Tx TSO Pkts", &Stats::txTsoPkts},
    {"Tx TSO Bytes", &Stats::txTsoBytes},
};

std::string CounterNames() {
    std::string names;
    for (const auto& [name, member] : kCounters)
        names += (names.empty() ? "" : ",") + std::string(name);
    return names;
}

}  // namespace

VfStats::VfStats() {
    Frame::Describe(
        *this, {"Get statistics for given VF of a SRIOV NIC.",
                "fetcher",
                "simple",
                {{"header:VF", "Statistics for %vf% VF of %NIC Name%"}, {"fields:VFStats", CounterNames()}}});
}

InputSpecPtr VfStats::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"nic-name", "n", Frame::kString,
         "The name of the SRIOV NIC. This must be one of the cards listed in the sriovNic list command.",
         Frame::kRequired},
        {"vf-id", "v", Frame::kInt,
         "The VF ID of the virtual function whose stats are to be collected. This must be one of the VF IDs "
         "listed "
         "in the sriovnic vf list command.",
         Frame::kRequired},
    });
}

OutputSpecPtr VfStats::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr VfStats::GetOutputStructure() {
    std::vector<Frame::Field> fields{Frame::StringField("NIC Name"), Frame::IntField("VF ID")};
    for (const auto& [name, member] : kCounters)
        fields.push_back(Frame::IntField(name));
    return Frame::MakeRecord("VfStats", fields);
}

void VfStats::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("nic-name");
    // The ID as typed, in base 10.
    const long long vfId = std::strtoll(input->GetParameter("vf-id").c_str(), nullptr, 10);
    Frame::HostCall(output, "Unable to get VF Stats. Error:", [&] {
        TknCtl::Network::NetworkInfoImpl info;
        if (!info.GetSriovNicByName(name)) {
            output->AddErrorMessage("There is no SRIOV Nic with name " + name);
            return;
        }
        // VF IDs are 8-bit: another number must not wrap round to an existing VF.
        if (vfId < 0 || vfId > 255)
            Frame::Fail("VF ID " + std::to_string(vfId) + " is out of range (0 to 255)");
        Stats stats;
        info.GetSriovNicVFStats(&stats, name, static_cast<std::uint8_t>(vfId));
        auto record = GetOutputStructure();
        record->SetField("NIC Name", name);
        record->SetField("VF ID", static_cast<long>(vfId));
        for (const auto& [field, member] : kCounters)
            record->SetField(field, stats.*member);
        auto list = Frame::MakeList(GetOutputStructure());
        list->Add(record);
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

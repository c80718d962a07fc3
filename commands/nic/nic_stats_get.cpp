#include "commands/nic/nic.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

namespace {

using Stats = HostCtl::Network::PnicStats;

// The counters, in record order.
const std::pair<const char*, std::uint64_t Stats::*> kCounters[] = {
    {"Packets received", &Stats::rxPackets},
    {"Packets sent", &Stats::txPackets},
    {"Bytes received", &Stats::rxBytes},
    {"Bytes sent", &Stats::txBytes},
    {"Receive packets dropped", &Stats::rxDropped},
    {"Transmit packets dropped", &Stats::txDropped},
    {"Multicast packets received", &Stats::rxMulticast},
    {"Broadcast packets received", &Stats::rxBroadcast},
    {"Multicast packets sent", &Stats::txMulticast},
    {"Broadcast packets sent", &Stats::txBroadcast},
    {"Total receive errors", &Stats::rxErrors},
    {"Receive length errors", &Stats::rxLengthErrors},
    {"Receive over errors", &Stats::rxOverErrors},
    {"Receive CRC errors", &Stats::rxCrcErrors},
    {"Receive frame errors", &Stats::rxFrameErrors},
    {"Receive FIFO errors", &Stats::rxFifoErrors},
    {"Receive missed errors", &Stats::rxMissedErrors},
    {"Total transmit errors", &Stats::txErrors},
    {"Transmit aborted errors", &Stats::txAbortedErrors},
    {"Transmit carrier errors", &Stats::txCarrierErrors},
    {"Transmit FIFO errors", &Stats::txFifoErrors},
    {"Transmit heartbeat errors", &Stats::txHeartbeatErrors},
    {"Transmit window errors", &Stats::txWindowErrors},
};

std::string CounterNames() {
    std::string names;
    for (const auto& [name, member] : kCounters)
        names += (names.empty() ? "" : ",") + std::string(name);
    return names;
}

}  // namespace

NicStatsGet::NicStatsGet() {
    Frame::Describe(*this,
                    {"Get NIC statistics for a given interface.",
                     "fetcher",
                     "simple",
                     {{"header:Nic", "NIC statistics for %NIC Name%"}, {"fields:Nic", CounterNames()}}});
}

InputSpecPtr NicStatsGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"nic-name", "n", Frame::kString, "Name of the NIC to get statistics from.", Frame::kRequired}});
}

OutputSpecPtr NicStatsGet::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicStatsGet::GetOutputStructure() {
    std::vector<Frame::Field> fields{Frame::StringField("NIC Name")};
    for (const auto& [name, member] : kCounters)
        fields.push_back(Frame::IntField(name));
    return Frame::MakeRecord("Nic", fields);
}

void NicStatsGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("nic-name");
    Frame::HostCall(output, "Unable to get stats for NIC: ", [&] {
        TknCtl::Network::PnicImpl pnic(name);
        Stats stats;
        pnic.GetPnicStats(stats);
        auto record = GetOutputStructure();
        record->SetField("NIC Name", pnic.GetName());
        for (const auto& [field, member] : kCounters)
            record->SetField(field, stats.*member);
        auto list = Frame::MakeList(GetOutputStructure());
        list->Add(record);
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

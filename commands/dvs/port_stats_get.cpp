#include <limits>

#include "commands/dvs/dvs.h"

namespace TalvexCli::NetworkNamespace {

namespace {

// Packets of a kind left after taking away broadcast and multicast packets. Counters are read
// one by one while traffic flows, so the parts may briefly exceed the whole: never below 0.
std::uint64_t Unicast(std::uint64_t total, std::uint64_t broadcast, std::uint64_t multicast) {
    const std::uint64_t other = broadcast > std::numeric_limits<std::uint64_t>::max() - multicast
                                    ? std::numeric_limits<std::uint64_t>::max()
                                    : broadcast + multicast;
    return total > other ? total - other : 0;
}

}  // namespace

PortStatsGet::PortStatsGet() {
    Frame::Describe(*this,
                    {"Packet statistics for a given port.",
                     "fetcher",
                     "simple",
                     {{"header:Port", "Packet statistics for port %Port ID%"},
                      {"fields:Port",
                       "Packets received,Packets sent,Bytes received,Bytes sent,Broadcast packets "
                       "received,Broadcast packets sent,Multicast packets received,Multicast packets "
                       "sent,Unicast packets received,Unicast packets sent,Receive packets dropped,Transmit "
                       "packets dropped"}}});
}

InputSpecPtr PortStatsGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"portid", "p", Frame::kInt, "Port ID for the port to get statistics.", Frame::kRequired}});
}

OutputSpecPtr PortStatsGet::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr PortStatsGet::GetOutputStructure() {
    return Frame::MakeRecord(
        "Port",
        {Frame::IntField("Port ID"), Frame::IntField("Packets received"), Frame::IntField("Packets sent"),
         Frame::IntField("Bytes received"), Frame::IntField("Bytes sent"),
         Frame::IntField("Broadcast packets received"), Frame::IntField("Broadcast packets sent"),
         Frame::IntField("Multicast packets received"), Frame::IntField("Multicast packets sent"),
         Frame::IntField("Unicast packets received"), Frame::IntField("Unicast packets sent"),
         Frame::IntField("Receive packets dropped"), Frame::IntField("Transmit packets dropped")});
}

void PortStatsGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, "Unable to get stats for port: ", [&] {
        auto portId = Dvs::ParseDecimal(input->GetParameter("portid"));
        auto port = portId ? Dvs::FindPort(*portId) : nullptr;
        if (!port) {
            output->AddErrorMessage("Couldn't find requested port");
            return;
        }
        const auto packets = port->GetPacketStats();
        const auto traffic = port->GetTrafficStats();
        auto record = GetOutputStructure();
        record->SetField("Port ID", port->GetPortId());
        record->SetField("Packets received", packets.packetsReceived);
        record->SetField("Packets sent", packets.packetsSent);
        record->SetField("Bytes received", traffic.bytesReceived);
        record->SetField("Bytes sent", traffic.bytesSent);
        record->SetField("Broadcast packets received", packets.broadcastReceived);
        record->SetField("Broadcast packets sent", packets.broadcastSent);
        record->SetField("Multicast packets received", packets.multicastReceived);
        record->SetField("Multicast packets sent", packets.multicastSent);
        record->SetField(
            "Unicast packets received",
            Unicast(packets.packetsReceived, packets.broadcastReceived, packets.multicastReceived));
        record->SetField("Unicast packets sent",
                         Unicast(packets.packetsSent, packets.broadcastSent, packets.multicastSent));
        record->SetField("Receive packets dropped", packets.droppedReceived);
        record->SetField("Transmit packets dropped", packets.droppedSent);
        auto list = Frame::MakeList(GetOutputStructure());
        list->Add(record);
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include <algorithm>

#include "commands/dvs/dvs.h"

namespace TalvexCli::NetworkNamespace {

namespace {

// The port type whose filters see traffic the other way round (an uplink port).
constexpr int kUplinkPortType = 4;

}  // namespace

bool sortFilterStats(const std::unique_ptr<HostCtl::Network::FilterStats>& a,
                     const std::unique_ptr<HostCtl::Network::FilterStats>& b) {
    if (a->direction != b->direction) return !a->direction;
    // std::string compares as unsigned bytes, a proper prefix first.
    return a->direction ? b->name < a->name : a->name < b->name;
}

PortFilterStatsGet::PortFilterStatsGet() {
    Frame::Describe(*this,
                    {"Filter statistics for a given port.",
                     "fetcher",
                     "simple",
                     {{"header:Filter", "Filter statistics for %Filter name%"},
                      {"fields:Filter",
                       "Filter direction,Packets in,Packets out,Packets dropped,Packets filtered,Packets "
                       "faulted,Packets queued,Packets injected,Packet errors"}}});
}

InputSpecPtr PortFilterStatsGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"portid", "p", Frame::kInt, "Port ID for the port to get filter statistics.", Frame::kRequired}});
}

OutputSpecPtr PortFilterStatsGet::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr PortFilterStatsGet::GetOutputStructure() {
    return Frame::MakeRecord("Filter",
                             {Frame::StringField("Filter name"), Frame::StringField("Filter direction"),
                              Frame::IntField("Packets in"), Frame::IntField("Packets out"),
                              Frame::IntField("Packets dropped"), Frame::IntField("Packets filtered"),
                              Frame::IntField("Packets faulted"), Frame::IntField("Packets queued"),
                              Frame::IntField("Packets injected"), Frame::IntField("Packet errors")});
}

void PortFilterStatsGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, "Unable to get filter stats for port: ", [&] {
        auto portId = Dvs::ParseDecimal(input->GetParameter("portid"));
        auto port = portId ? Dvs::FindPort(*portId) : nullptr;
        if (!port) {
            output->AddErrorMessage("Couldn't find requested port");
            return;
        }
        auto list = Frame::MakeList(GetOutputStructure());
        output->SetRootObject(list);
        auto filters = port->GetFilterStats();
        std::erase(filters, nullptr);
        std::sort(filters.begin(), filters.end(), sortFilterStats);
        const bool uplinkPort = !filters.empty() && port->GetPortType() == kUplinkPortType;
        for (const auto& filter : filters) {
            if (!filter->valid) continue;
            auto record = GetOutputStructure();
            record->SetField("Filter name", filter->name);
            record->SetField("Filter direction", filter->direction != uplinkPort ? "Transmit" : "Receive");
            record->SetField("Packets in", filter->packetsIn);
            record->SetField("Packets out", filter->packetsOut);
            record->SetField("Packets dropped", filter->packetsDropped);
            if (filter->extendedValid) {
                record->SetField("Packets filtered", filter->packetsFiltered);
                record->SetField("Packets faulted", filter->packetsFaulted);
                record->SetField("Packets queued", filter->packetsQueued);
                record->SetField("Packets injected", filter->packetsInjected);
                record->SetField("Packet errors", filter->packetErrors);
            }
            list->Add(record);
        }
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicCoalesceLowGet::NicCoalesceLowGet() {
    Frame::Describe(
        *this,
        {"Get information about the behavior of a NIC when it sends or receives packets at low packet rate.",
         "fetcher",
         "simple",
         {{"fields:CoalesceParamsAtLowPacketRate",
           "NIC,Packet rate,RX delay time,RX delay packets,TX delay time,TX delay packets"},
          {"units:CoalesceParamsAtLowPacketRate.Packet rate", "pps"},
          {"units:CoalesceParamsAtLowPacketRate.RX delay time", "microsecond"},
          {"units:CoalesceParamsAtLowPacketRate.TX delay time", "microsecond"}}});
}

InputSpecPtr NicCoalesceLowGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"vmnic", "n", Frame::kString, "The name of the pnic for which information should be retrieved.",
          Frame::kRequired}});
}

OutputSpecPtr NicCoalesceLowGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr NicCoalesceLowGet::GetOutputStructure() {
    return Frame::MakeRecord("CoalesceParamsAtLowPacketRate",
                             {Frame::StringField("NIC"), Frame::IntField("Packet rate"),
                              Frame::IntField("RX delay time"), Frame::IntField("RX delay packets"),
                              Frame::IntField("TX delay time"), Frame::IntField("TX delay packets")});
}

void NicCoalesceLowGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        HostCtl::Network::PnicCoalesceParams params;
        pnic->GetCoalesceParams(params);
        auto record = GetOutputStructure();
        record->SetField("NIC", name);
        record->SetField("Packet rate", params.pktRateLow);
        record->SetField("RX delay time", params.rxUsecsLow);
        record->SetField("RX delay packets", params.rxMaxFramesLow);
        record->SetField("TX delay time", params.txUsecsLow);
        record->SetField("TX delay packets", params.txMaxFramesLow);
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicCoalesceHighGet::NicCoalesceHighGet() {
    Frame::Describe(
        *this,
        {"Get information about the behavior of a NIC when it sends or receives packets at high packet rate.",
         "fetcher",
         "simple",
         {{"fields:CoalesceParamsAtHighPacketRate",
           "NIC,Packet rate,RX delay time,RX delay packets,TX delay time,TX delay packets"},
          {"units:CoalesceParamsAtHighPacketRate.Packet rate", "pps"},
          {"units:CoalesceParamsAtHighPacketRate.RX delay time", "microsecond"},
          {"units:CoalesceParamsAtHighPacketRate.TX delay time", "microsecond"}}});
}

InputSpecPtr NicCoalesceHighGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"vmnic", "n", Frame::kString, "The name of the pnic for which information should be retrieved.",
          Frame::kRequired}});
}

OutputSpecPtr NicCoalesceHighGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr NicCoalesceHighGet::GetOutputStructure() {
    return Frame::MakeRecord("CoalesceParamsAtHighPacketRate",
                             {Frame::StringField("NIC"), Frame::IntField("Packet rate"),
                              Frame::IntField("RX delay time"), Frame::IntField("RX delay packets"),
                              Frame::IntField("TX delay time"), Frame::IntField("TX delay packets")});
}

void NicCoalesceHighGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        HostCtl::Network::PnicCoalesceParams params;
        pnic->GetCoalesceParams(params);
        auto record = GetOutputStructure();
        record->SetField("NIC", name);
        record->SetField("Packet rate", params.pktRateHigh);
        record->SetField("RX delay time", params.rxUsecsHigh);
        record->SetField("RX delay packets", params.rxMaxFramesHigh);
        record->SetField("TX delay time", params.txUsecsHigh);
        record->SetField("TX delay packets", params.txMaxFramesHigh);
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

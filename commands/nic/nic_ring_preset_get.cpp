#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicRingPresetGet::NicRingPresetGet() {
    Frame::Describe(*this, {"Get preset RX/TX ring buffer parameters of a NIC",
                            "fetcher",
                            "simple",
                            {{"fields:RingInfo", "RX,RX Mini,RX Jumbo,TX"}}});
}

InputSpecPtr NicRingPresetGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"nic-name", "n", Frame::kString,
          "The name of the NIC whose preset RX/TX ring buffer parameters should be retrieved.",
          Frame::kRequired}});
}

OutputSpecPtr NicRingPresetGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr NicRingPresetGet::GetOutputStructure() {
    return Frame::MakeRecord("RingInfo", {Frame::IntField("RX"), Frame::IntField("RX Mini"),
                                          Frame::IntField("RX Jumbo"), Frame::IntField("TX")});
}

void NicRingPresetGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("nic-name");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("NIC with name " + name + " not found");
        HostCtl::Network::PnicRingParams ring;
        pnic->GetRingParams(ring);
        auto record = GetOutputStructure();
        record->SetField("RX", ring.rxMax);
        record->SetField("RX Mini", ring.rxMiniMax);
        record->SetField("RX Jumbo", ring.rxJumboMax);
        record->SetField("TX", ring.txMax);
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

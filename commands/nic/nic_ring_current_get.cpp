#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicRingCurrentGet::NicRingCurrentGet() {
    Frame::Describe(*this, {"Get current RX/TX ring buffer parameters of a NIC",
                            "fetcher",
                            "simple",
                            {{"fields:RingInfo", "RX,RX Mini,RX Jumbo,TX"}}});
}

InputSpecPtr NicRingCurrentGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"nic-name", "n", Frame::kString,
          "The name of the NIC whose current RX/TX ring buffer parameters should be retrieved.",
          Frame::kRequired}});
}

OutputSpecPtr NicRingCurrentGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr NicRingCurrentGet::GetOutputStructure() {
    return Frame::MakeRecord("RingInfo", {Frame::IntField("RX"), Frame::IntField("RX Mini"),
                                          Frame::IntField("RX Jumbo"), Frame::IntField("TX")});
}

void NicRingCurrentGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("nic-name");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("NIC with name " + name + " not found");
        HostCtl::Network::PnicRingParams ring;
        pnic->GetRingParams(ring);
        auto record = GetOutputStructure();
        record->SetField("RX", ring.rx);
        record->SetField("RX Mini", ring.rxMini);
        record->SetField("RX Jumbo", ring.rxJumbo);
        record->SetField("TX", ring.tx);
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicCsoSet::NicCsoSet() {
    Frame::Describe(*this, {"Set checksum offload settings on a nic"});
}

InputSpecPtr NicCsoSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vmnic", "n", Frame::kString, "Name of vmnic to set offload settings.", Frame::kRequired},
        {"enable", "e", Frame::kInt, "RX/TX checksum offload", Frame::kRequired, Frame::Range(0, 1)},
    });
}

OutputSpecPtr NicCsoSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicCsoSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    const bool enable = input->GetParameterInt("enable") != 0;
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        HostCtl::Network::PnicOffloadSettings settings;
        pnic->GetOffloadSettings(settings);
        settings.mask = HostCtl::Network::PNIC_OFFLOAD_RX_CSUM | HostCtl::Network::PNIC_OFFLOAD_TX_CSUM;
        settings.rxChecksum = enable;
        settings.txChecksum = enable;
        pnic->SetOffloadSettings(settings);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

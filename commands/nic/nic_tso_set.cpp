#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicTsoSet::NicTsoSet() {
    Frame::Describe(*this, {"Set TCP segmentation offload settings on a nic"});
}

InputSpecPtr NicTsoSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vmnic", "n", Frame::kString, "Name of vmnic to set TSO settings.", Frame::kRequired},
        {"enable", "e", Frame::kInt, "TCP segmentation offload", Frame::kRequired, Frame::Range(0, 1)},
    });
}

OutputSpecPtr NicTsoSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicTsoSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    const bool enable = input->GetParameterInt("enable") != 0;
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        HostCtl::Network::PnicOffloadSettings settings;
        pnic->GetOffloadSettings(settings);
        settings.mask = HostCtl::Network::PNIC_OFFLOAD_TSO;
        settings.tso = enable;
        pnic->SetOffloadSettings(settings);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

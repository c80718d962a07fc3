#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicSgSet::NicSgSet() {
    Frame::Describe(*this, {"Set scatter-gatter settings on a nic"});
}

InputSpecPtr NicSgSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vmnic", "n", Frame::kString, "Name of vmnic to configure scatter-gather settings.",
         Frame::kRequired},
        {"enable", "e", Frame::kInt, "Enable/disable sacatter-gather", Frame::kRequired, Frame::Range(0, 1)},
    });
}

OutputSpecPtr NicSgSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicSgSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    const bool enable = input->GetParameterInt("enable") != 0;
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        HostCtl::Network::PnicOffloadSettings settings;
        pnic->GetOffloadSettings(settings);
        settings.mask = HostCtl::Network::PNIC_OFFLOAD_SG;
        settings.scatterGather = enable;
        pnic->SetOffloadSettings(settings);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/ens/ens.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::NetworkInfo;

EnsLcoreSwitchAdd::EnsLcoreSwitchAdd() {
    Frame::Describe(*this, {"Associate given ENS context with given switch.", "operation"});
}

InputSpecPtr EnsLcoreSwitchAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({{EnsParam::kLcoreId, "l", Frame::kInt, "ENS context id.", Frame::kRequired},
                                 {EnsParam::kSwitch, "s", Frame::kString, "Switch name.", Frame::kRequired}});
}

OutputSpecPtr EnsLcoreSwitchAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void EnsLcoreSwitchAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        Frame::SetResult(output, NetworkInfo::AddLcoreSwitch(
                                     input->GetParameter(EnsParam::kSwitch),
                                     static_cast<unsigned long>(input->GetParameterInt(EnsParam::kLcoreId))));
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/ens/ens.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::NetworkInfo;

EnsLcoreSwitchRemove::EnsLcoreSwitchRemove() {
    Frame::Describe(*this, {"Disassociate given ENS context from virtual switch.", "operation"});
}

InputSpecPtr EnsLcoreSwitchRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{EnsParam::kLcoreId, "l", Frame::kInt, "ENS context id.", Frame::kRequired}});
}

OutputSpecPtr EnsLcoreSwitchRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void EnsLcoreSwitchRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        // Disassociating is associating with the switch named "null".
        Frame::SetResult(output,
                         NetworkInfo::AddLcoreSwitch(
                             "null", static_cast<unsigned long>(input->GetParameterInt(EnsParam::kLcoreId))));
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/ens/ens.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::NetworkInfo;

EnsLcoreRemove::EnsLcoreRemove() {
    Frame::Describe(*this, {"Destroy ENS context.", "operation"});
}

InputSpecPtr EnsLcoreRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{EnsParam::kLcoreId, "l", Frame::kInt, "ENS context id to be destroyed.", Frame::kRequired}});
}

OutputSpecPtr EnsLcoreRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void EnsLcoreRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        Frame::SetResult(output, NetworkInfo::RemoveLcore(
                                     static_cast<unsigned long>(input->GetParameterInt(EnsParam::kLcoreId))));
    });
}

}  // namespace TalvexCli::NetworkNamespace

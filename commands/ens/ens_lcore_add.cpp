#include "commands/ens/ens.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::NetworkInfo;

EnsLcoreAdd::EnsLcoreAdd() {
    Frame::Describe(*this, {"Create ENS context.", "operation"});
}

InputSpecPtr EnsLcoreAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{EnsParam::kLcoreId, "l", Frame::kInt, "ENS context id to be created.", Frame::kRequired}});
}

OutputSpecPtr EnsLcoreAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void EnsLcoreAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        Frame::SetResult(output, NetworkInfo::AddLcore(
                                     static_cast<unsigned long>(input->GetParameterInt(EnsParam::kLcoreId))));
    });
}

}  // namespace TalvexCli::NetworkNamespace

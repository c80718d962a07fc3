#include "commands/ens/ens.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::NetworkInfo;

EnsMaxlcoresSet::EnsMaxlcoresSet() {
    Frame::Describe(*this, {"Set the maximum number of ENS contexts.", "operation"});
}

InputSpecPtr EnsMaxlcoresSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({{EnsParam::kMaxLcores, "n", Frame::kInt,
                                  "Number of maximum ENS contexts to be assigned.", Frame::kRequired}});
}

OutputSpecPtr EnsMaxlcoresSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void EnsMaxlcoresSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        Frame::SetResult(output, NetworkInfo::SetMaxLcores(static_cast<unsigned long>(
                                     input->GetParameterInt(EnsParam::kMaxLcores))));
    });
}

}  // namespace TalvexCli::NetworkNamespace

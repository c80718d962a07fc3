#include <limits>

#include "commands/ens/ens.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::NetworkInfo;

EnsLcoreAffinitySet::EnsLcoreAffinitySet() {
    Frame::Describe(*this, {"Set affinity for given ENS context.", "operation"});
}

InputSpecPtr EnsLcoreAffinitySet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {EnsParam::kLcoreId, "l", Frame::kInt, "ENS context id.", Frame::kRequired},
        {EnsParam::kAffinity, "a", Frame::kInt, "Numa node affinity.", Frame::kRequired},
    });
}

OutputSpecPtr EnsLcoreAffinitySet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void EnsLcoreAffinitySet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::int64_t affinity = input->GetParameterInt(EnsParam::kAffinity);
    const auto lcoreId = static_cast<unsigned long>(input->GetParameterInt(EnsParam::kLcoreId));
    Frame::HostCall(output, [&] {
        // A node number the host's parameter cannot hold would arrive as another node.
        if (affinity < 0 || affinity > static_cast<std::int64_t>(std::numeric_limits<unsigned int>::max()))
            Frame::Fail("NUMA node " + std::to_string(affinity) + " does not exist");
        // The node comes first, the context second.
        Frame::SetResult(output, NetworkInfo::SetLcoreAffinity(static_cast<unsigned int>(affinity), lcoreId));
    });
}

}  // namespace TalvexCli::NetworkNamespace

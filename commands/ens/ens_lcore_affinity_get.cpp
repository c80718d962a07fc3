#include "commands/ens/ens.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::NetworkInfo;

EnsLcoreAffinityGet::EnsLcoreAffinityGet() {
    Frame::Describe(*this, {"Get the affinity for given ENS context.", "fetcher", "simple"});
}

InputSpecPtr EnsLcoreAffinityGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{EnsParam::kLcoreId, "l", Frame::kInt, "ENS context id.", Frame::kRequired}});
}

OutputSpecPtr EnsLcoreAffinityGet::GetOutputSpecInternal() {
    return Frame::IntOutput();
}

void EnsLcoreAffinityGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        output->SetRootObject(Zorbel::MetaObj::MetaInt::New(static_cast<long>(NetworkInfo::GetLcoreAffinity(
            static_cast<unsigned long>(input->GetParameterInt(EnsParam::kLcoreId))))));
    });
}

}  // namespace TalvexCli::NetworkNamespace

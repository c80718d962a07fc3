#include "commands/ens/ens.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::NetworkInfo;

EnsLcoreSwitchGet::EnsLcoreSwitchGet() {
    Frame::Describe(*this, {"Get the switch associated with given ENS context.", "fetcher", "simple"});
}

InputSpecPtr EnsLcoreSwitchGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{EnsParam::kLcoreId, "l", Frame::kInt, "ENS context id.", Frame::kRequired}});
}

OutputSpecPtr EnsLcoreSwitchGet::GetOutputSpecInternal() {
    return Frame::StringOutput();
}

void EnsLcoreSwitchGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        output->SetRootObject(Zorbel::MetaObj::MetaString::New(NetworkInfo::GetLcoreSwitch(
            static_cast<unsigned long>(input->GetParameterInt(EnsParam::kLcoreId)))));
    });
}

}  // namespace TalvexCli::NetworkNamespace

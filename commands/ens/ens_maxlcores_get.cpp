#include "commands/ens/ens.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::NetworkInfo;

EnsMaxlcoresGet::EnsMaxlcoresGet() {
    Frame::Describe(*this, {"Get the maximum number of ENS contexts (lcores).", "fetcher", "simple"});
}

InputSpecPtr EnsMaxlcoresGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr EnsMaxlcoresGet::GetOutputSpecInternal() {
    return Frame::IntOutput();
}

void EnsMaxlcoresGet::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, [&] {
        output->SetRootObject(Zorbel::MetaObj::MetaInt::NewUnsigned(NetworkInfo::GetMaxLcores()));
    });
}

}  // namespace TalvexCli::NetworkNamespace

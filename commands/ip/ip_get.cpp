#include "commands/ip/ip.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

IpGet::IpGet() {
    Frame::Describe(*this, {"Get global IP settings", "fetcher", "simple"});
}

InputSpecPtr IpGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr IpGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr IpGet::GetOutputStructure() {
    return Frame::MakeRecord("IPInfo", {Frame::BoolField("IPv6 Enabled")});
}

void IpGet::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::Network::NetworkInfoImpl networkInfo;
        auto record = GetOutputStructure();
        record->SetField("IPv6 Enabled", networkInfo.IsTknIpv6Enabled());
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

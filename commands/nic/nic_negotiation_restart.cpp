#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicNegotiationRestart::NicNegotiationRestart() {
    Frame::Describe(*this, {"Restart N-Way negotiation on a nic"});
}

InputSpecPtr NicNegotiationRestart::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"vmnic", "n", Frame::kString, "Name of vmnic to restart negotiation", Frame::kRequired}});
}

OutputSpecPtr NicNegotiationRestart::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicNegotiationRestart::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        TknCtl::Network::NetworkInfoImpl info;
        auto pnic = info.GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        pnic->RestartNegotiation();
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

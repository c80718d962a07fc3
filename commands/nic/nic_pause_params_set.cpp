#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicPauseParamsSet::NicPauseParamsSet() {
    Frame::Describe(*this, {"Set pause parameters for a NIC", "operation"});
}

InputSpecPtr NicPauseParamsSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"nic-name", "n", Frame::kString, "Name of NIC whose pause parameters should be set.",
         Frame::kRequired},
        {"auto", "a", Frame::kBool, "Enable/disable auto negotiation."},
        {"rx", "r", Frame::kBool, "Enable/disable pause RX flow control."},
        {"tx", "t", Frame::kBool, "Enable/disable pause TX flow control."},
    });
}

OutputSpecPtr NicPauseParamsSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicPauseParamsSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("nic-name");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("NIC with name " + name + " not found");
        HostCtl::Network::PnicPauseParams pause;
        pnic->GetPauseParams(pause);
        if (input->HasParameter("auto")) pause.autoNegotiate = input->GetParameterBool("auto");
        if (input->HasParameter("rx")) pause.rx = input->GetParameterBool("rx");
        if (input->HasParameter("tx")) pause.tx = input->GetParameterBool("tx");
        pnic->SetPauseParams(pause);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

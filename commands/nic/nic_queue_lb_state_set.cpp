#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicQueueLbStateSet::NicQueueLbStateSet() {
    Frame::Describe(*this, {"Enable/disable netqueue balancer on a NIC"});
}

InputSpecPtr NicQueueLbStateSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vmnic", "n", Frame::kString, "Name of vmnic to change netqueue balancer state", Frame::kRequired},
        {"enable", "e", Frame::kBool, "Netqueue balancer state", Frame::kRequired},
    });
}

OutputSpecPtr NicQueueLbStateSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicQueueLbStateSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("Invalid PNIC name " + name);
        HostCtl::Network::PnicNetqueueInfo netqueue;
        netqueue.balancerEnabled = input->GetParameterBool("enable");
        netqueue.stateChanged = true;
        pnic->SetNetqueueInfo(netqueue);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

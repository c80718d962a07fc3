#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicQueueCountSet::NicQueueCountSet() {
    Frame::Describe(*this, {"Set number of netqueues on a nic"});
}

InputSpecPtr NicQueueCountSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vmnic", "n", Frame::kString, "Name of vmnic to set netqueue count.", Frame::kRequired},
        {"tx", "t", Frame::kBool, "Tx netqueue to set count."},
        {"rx", "r", Frame::kBool, "Rx netqueue to set count."},
        {"num", "q", Frame::kInt, "Number of queues to set."},
    });
}

OutputSpecPtr NicQueueCountSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicQueueCountSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        HostCtl::Network::PnicNetqueueInfo netqueue;
        // "--tx false" still names the TX queues: the flag's value is not looked at.
        if (input->HasParameter("tx")) {
            netqueue.txQueueCount = Nic::Uint32Parameter(*input, "num");
            netqueue.setTxCount = true;
        }
        if (input->HasParameter("rx")) {
            netqueue.rxQueueCount = Nic::Uint32Parameter(*input, "num");
            netqueue.setRxCount = true;
        }
        if (netqueue.setTxCount || netqueue.setRxCount) pnic->SetNetqueueInfo(netqueue);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

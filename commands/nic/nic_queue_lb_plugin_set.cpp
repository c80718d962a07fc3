#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicQueueLbPluginSet::NicQueueLbPluginSet() {
    Frame::Describe(*this, {"Enable/disable netqueue balancer plugin on a NIC"});
}

InputSpecPtr NicQueueLbPluginSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vmnic", "n", Frame::kString, "Name of vmnic to change netqueue balancer plugin state",
         Frame::kRequired},
        {"enable", "e", Frame::kBool, "Netqueue balancer plugin state", Frame::kRequired},
        {"module", "m", Frame::kString, "Name of netqueue balancer module", Frame::kRequired},
        {"plugin", "p", Frame::kString, "Name of netqueue balancer plugin", Frame::kRequired},
    });
}

OutputSpecPtr NicQueueLbPluginSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicQueueLbPluginSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("Invalid PNIC name " + name);
        HostCtl::Network::PnicNetqueueInfo netqueue;
        netqueue.plugins.push_back({input->GetParameter("module"), input->GetParameter("plugin"), ""});
        netqueue.pluginEnabled = input->GetParameterBool("enable");
        netqueue.pluginChanged = true;
        pnic->SetNetqueueInfo(netqueue);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

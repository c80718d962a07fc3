#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicQueueLbSettingSet::NicQueueLbSettingSet() {
    Frame::Describe(*this, {"Enable/disable netqueue load balancer setting on a NIC."});
}

namespace {

// The feature parameters in mask-bit order (bit i = 1 << i).
const std::pair<const char*, const char*> kParameters[HostCtl::Network::PNIC_NETQ_LB_FEATURE_COUNT] = {
    {"rxqpair", "Configure Rx queue pair at netqueue load balancer."},
    {"rxqnofeat", "Configure Rx queue no feature at netqueue load balancer."},
    {"rxqpreempt", "Configure pre-emptible queue at netqueue load balancer."},
    {"rxqlatency", "Configure Rx queue latency at netqueue load balancer."},
    {"rxdynlb", "Configure RX dynamic load balancing at netqueue load balancer."},
    {"dynpoollb", "Configure Dynamic queue pool at netqueue load balancer."},
    {"maclearnlb", "Configure Mac learn load balancing at netqueue load balancer."},
    {"rsslb", "Configure Receive Side Scaling at netqueue load balancer."},
    {"lrolb", "Configure Large Receive Offload at netqueue load balancer."},
    {"geneveoamlb", "Configure Geneve OAM at netqueue load balancer."},
};

}  // namespace

InputSpecPtr NicQueueLbSettingSet::GetInputSpecInternal() {
    std::vector<Frame::Param> params{{"vmnic", "n", Frame::kString,
                                      "Name of vmnic to update netqueue load balancer setting.",
                                      Frame::kRequired}};
    for (const auto& [name, description] : kParameters)
        params.push_back({name, "", Frame::kBool, description});
    return Frame::MakeInputSpec(params);
}

OutputSpecPtr NicQueueLbSettingSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicQueueLbSettingSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        HostCtl::Network::PnicNetqueueInfo netqueue;
        for (std::size_t i = 0; i < std::size(kParameters); ++i) {
            if (!input->HasParameter(kParameters[i].first)) continue;
            netqueue.lbMask |= 1u << i;
            netqueue.lbAllowed[i] = input->GetParameterBool(kParameters[i].first);
        }
        if (netqueue.lbMask != 0) pnic->SetNetqueueInfo(netqueue);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicCoalesceHighSet::NicCoalesceHighSet() {
    Frame::Describe(*this,
                    {"Set parameters to control the behavior of a NIC when it sends or receives packets at "
                     "high packet rate."});
}

InputSpecPtr NicCoalesceHighSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vmnic", "n", Frame::kString, "Name of the vmnic for which parameters should be set.",
         Frame::kRequired},
        {"pkt-rate", "p", Frame::kInt,
         "The high packet rate measured in number of packets per second. When packet rate is above this "
         "parameter, the RX/TX coalescing parameters configured by this command are used."},
        {"rx-usecs", "r", Frame::kInt,
         "The number of microseconds to delay an RX interrupt after a packet arrives under high packet rate "
         "conditions."},
        {"rx-max-frames", "R", Frame::kInt,
         "The maximum number of RX packets to delay an RX interrupt after they arrive under high packet rate "
         "conditions."},
        {"tx-usecs", "t", Frame::kInt,
         "The number of microseconds to delay a TX interrupt after a packet is sent under high packet rate "
         "conditions."},
        {"tx-max-frames", "T", Frame::kInt,
         "The maximum number of TX packets to delay an TX interrupt after they are sent under high packet "
         "rate "
         "conditions."},
    });
}

OutputSpecPtr NicCoalesceHighSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicCoalesceHighSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    using Params = HostCtl::Network::PnicCoalesceParams;
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        Params params;
        pnic->GetCoalesceParams(params);
        const std::pair<const char*, std::uint32_t Params::*> fields[] = {
            {"pkt-rate", &Params::pktRateHigh},
            {"rx-usecs", &Params::rxUsecsHigh},
            {"rx-max-frames", &Params::rxMaxFramesHigh},
            {"tx-usecs", &Params::txUsecsHigh},
            {"tx-max-frames", &Params::txMaxFramesHigh}};
        for (const auto& [parameter, field] : fields) {
            if (input->HasParameter(parameter)) params.*field = Nic::Uint32Parameter(*input, parameter);
        }
        pnic->SetCoalesceParams(params);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicCoalesceSet::NicCoalesceSet() {
    Frame::Describe(*this, {"Set coalesce parameters on a nic"});
}

InputSpecPtr NicCoalesceSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vmnic", "n", Frame::kString, "Name of vmnic to set coalesce parameters.", Frame::kRequired},
        {"rx-usecs", "r", Frame::kInt, "Number of microseconds driver to wait for RX before interrupting."},
        {"rx-max-frames", "R", Frame::kInt,
         "Maximum number of RX frames driver to process before interrupting."},
        {"tx-usecs", "t", Frame::kInt,
         "Number of microseconds driver to wait for completed TX before interrupting."},
        {"tx-max-frames", "T", Frame::kInt,
         "Maximum number of completed TX frames driver to process before interrupting."},
        {"adaptive-rx", "a", Frame::kBool, "enable or disable adaptive RX algorithm in driver."},
        {"adaptive-tx", "A", Frame::kBool, "enable or disable adaptive TX algorithm in driver."},
        {"sample-interval", "i", Frame::kInt,
         "Packet rate sampling internal in seconds for the adaptive coalescing algorithm in driver.",
         Frame::kOptional, Frame::Range(1, 3600)},
    });
}

OutputSpecPtr NicCoalesceSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicCoalesceSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        HostCtl::Network::PnicCoalesceParams params;
        pnic->GetCoalesceParams(params);
        const std::pair<const char*, std::uint32_t HostCtl::Network::PnicCoalesceParams::*> counts[] = {
            {"rx-usecs", &HostCtl::Network::PnicCoalesceParams::rxUsecs},
            {"rx-max-frames", &HostCtl::Network::PnicCoalesceParams::rxMaxFrames},
            {"tx-usecs", &HostCtl::Network::PnicCoalesceParams::txUsecs},
            {"tx-max-frames", &HostCtl::Network::PnicCoalesceParams::txMaxFrames}};
        for (const auto& [parameter, field] : counts) {
            if (input->HasParameter(parameter)) params.*field = Nic::Uint32Parameter(*input, parameter);
        }
        if (input->HasParameter("adaptive-rx")) params.adaptiveRx = input->GetParameterBool("adaptive-rx");
        if (input->HasParameter("adaptive-tx")) params.adaptiveTx = input->GetParameterBool("adaptive-tx");
        if (input->HasParameter("sample-interval"))
            params.sampleInterval = Nic::Uint32Parameter(*input, "sample-interval");
        pnic->SetCoalesceParams(params);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicRingCurrentSet::NicRingCurrentSet() {
    Frame::Describe(*this, {"Set current RX/TX ring buffer parameters of a NIC", "operation"});
}

InputSpecPtr NicRingCurrentSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"nic-name", "n", Frame::kString,
         "The name of the NIC whose current RX/TX ring buffer parameters should be set.", Frame::kRequired},
        {"rx", "r", Frame::kInt, "Number of ring entries for the RX ring."},
        {"rx-mini", "m", Frame::kInt, "Number of ring entries for the RX mini ring."},
        {"rx-jumbo", "j", Frame::kInt, "Number of ring entries for the RX jumbo ring."},
        {"tx", "t", Frame::kInt, "Number of ring entries for the TX ring."},
    });
}

OutputSpecPtr NicRingCurrentSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicRingCurrentSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    using Ring = HostCtl::Network::PnicRingParams;
    const std::string& name = input->GetParameter("nic-name");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("NIC with name " + name + " not found");
        Ring ring;
        const std::tuple<const char*, std::uint8_t, std::uint32_t Ring::*> sizes[] = {
            {"rx", HostCtl::Network::PNIC_RING_RX, &Ring::rx},
            {"rx-mini", HostCtl::Network::PNIC_RING_RX_MINI, &Ring::rxMini},
            {"rx-jumbo", HostCtl::Network::PNIC_RING_RX_JUMBO, &Ring::rxJumbo},
            {"tx", HostCtl::Network::PNIC_RING_TX, &Ring::tx}};
        for (const auto& [parameter, bit, field] : sizes) {
            if (!input->HasParameter(parameter)) continue;
            ring.mask |= bit;
            ring.*field = Nic::Uint32Parameter(*input, parameter);
        }
        if (ring.mask != 0) pnic->SetRingParams(ring);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

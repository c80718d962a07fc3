#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicDown::NicDown() {
    Frame::Describe(*this, {"Bring down the specified network device.", "operation"});
}

InputSpecPtr NicDown::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"nic-name", "n", Frame::kString,
          "The name of the NIC to configured. This must be one of the cards listed in the nic list command.",
          Frame::kRequired}});
}

OutputSpecPtr NicDown::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicDown::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("nic-name");
    Frame::HostCall(output, [&] {
        TknCtl::Network::NetworkInfoImpl info;
        auto pnic = info.GetPnicByName(name);
        if (!pnic) Frame::Fail("There is no pnic with name " + name);
        pnic->SetAdminUp(false);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

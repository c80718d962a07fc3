#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicUp::NicUp() {
    Frame::Describe(*this, {"Bring up the specified network device.", "operation"});
}

InputSpecPtr NicUp::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"nic-name", "n", Frame::kString,
          "The name of the NIC to configured. This must be one of the cards listed in the nic list command.",
          Frame::kRequired}});
}

OutputSpecPtr NicUp::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicUp::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("nic-name");
    Frame::HostCall(output, [&] {
        TknCtl::Network::NetworkInfoImpl info;
        auto pnic = info.GetPnicByName(name);
        if (!pnic) Frame::Fail("There is no pnic with name " + name);
        pnic->SetAdminUp(true);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchStandardAdd::VirtualSwitchStandardAdd() {
    Frame::Describe(*this, {"Add a new virtual switch to the Hadro networking system.", "operation"});
}

InputSpecPtr VirtualSwitchStandardAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vswitch-name", "v", Frame::kString, "The name of the virtual switch to create.", Frame::kRequired},
        {"ports", "P", Frame::kInt,
         "The number of ports to to give this newly created virtual switch. Maximum ports per virtual switch "
         "is "
         "4096. If no value is given the default value(128) is used. The number of ports is limited by the "
         "number "
         "of already allocated ports on the host. The system wide port count cannot be greater than 4608.",
         Frame::kOptional, Frame::Range(1, 4096)},
    });
}

OutputSpecPtr VirtualSwitchStandardAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchStandardAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    using namespace HostCtl::Network;
    const std::string& name = input->GetParameter("vswitch-name");
    std::uint32_t ports = Portset::DEF_NUM_PORTS;
    if (input->HasParameter("ports")) ports = static_cast<std::uint32_t>(input->GetParameterInt("ports"));
    Frame::HostCall(output, [&] {
        const auto capabilities = NicCapabilities::GetDefaultPolicy();
        const auto shaping = ShapingPolicy::GetDefaultPolicy();
        const auto security = PortSecurityPolicy::GetDefaultPolicy();
        const auto teaming = NicTeamingPolicy::GetDefaultPolicy();
        TknCtl::Network::VirtualSwitchInfoImpl info;
        info.AddVirtualSwitchWithPolicy(teaming, security, shaping, capabilities, name, ports);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

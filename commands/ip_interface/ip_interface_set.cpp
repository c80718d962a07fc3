#include "commands/ip_interface/ip_interface.h"

namespace TalvexCli::NetworkNamespace {

IpInterfaceSet::IpInterfaceSet() {
    Frame::Describe(
        *this, {"This command sets the enabled status and MTU size of a given IP interface ", "operation"});
}

InputSpecPtr IpInterfaceSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"interface-name", "i", Frame::kString, "The name of the interface to apply the configurations.",
         Frame::kRequired},
        {"enabled", "e", Frame::kBool, "Set to true to enable the interface, set to false to disable it."},
        {"mtu", "m", Frame::kInt, "The MTU size of the IP interface. "},
    });
}

OutputSpecPtr IpInterfaceSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpInterfaceSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("interface-name");
    Frame::HostCall(output, [&] {
        auto nic = IpInterface::FindByName(name);
        if (!nic) {
            output->AddErrorMessage("Unable to find an interface with name " + name);
            return;
        }
        if (input->HasParameter("enabled")) {
            if (input->GetParameterBool("enabled")) {
                nic->Enable();
            } else {
                nic->Disable();
            }
        }
        if (input->HasParameter("mtu")) {
            std::int64_t mtu = input->GetParameterInt("mtu");
            if (mtu < 0) {
                output->AddErrorMessage("MTU size should be a positive value");
                return;
            }
            // A value beyond the range of int cannot be an MTU; the host refuses it with its bounds.
            nic->SetMtu(mtu > INT32_MAX ? INT32_MAX : static_cast<int>(mtu));
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

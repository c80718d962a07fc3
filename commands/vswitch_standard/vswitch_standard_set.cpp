#include <algorithm>
#include <climits>
#include <iterator>

#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

namespace {
// CDP status names, index = code.
const char* const kCdpStatus[] = {"down", "listen", "advertise", "both"};
}  // namespace

VirtualSwitchStandardSet::VirtualSwitchStandardSet() {
    Frame::Describe(
        *this, {"This command sets the MTU size and CDP status of a given virtual switch.", "operation"});
}

InputSpecPtr VirtualSwitchStandardSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vswitch-name", "v", Frame::kString, "The name of virtual switch to apply the configurations.",
         Frame::kRequired},
        {"mtu", "m", Frame::kInt, "The MTU size of the given virtual switch. "},
        {"cdp-status", "c", Frame::kString,
         "The CDP status of the given virtual switch. It can be 'down', 'listen', 'advertise' or 'both'",
         Frame::kOptional,
         Frame::StringEnum({{"down", "CDP status is 'down'"},
                            {"listen", "CDP status is 'listen'"},
                            {"advertise", "CDP status is 'advertise'"},
                            {"both", "CDP status is 'both'"}})},
    });
}

OutputSpecPtr VirtualSwitchStandardSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void VirtualSwitchStandardSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vswitch-name");
    Frame::HostCall(output, [&] {
        if (!TknCtl::Network::PortsetImpl::IsValidVirtualSwitch(name)) {
            output->AddErrorMessage(name + " is not a valid name for a virtual switch");
            return;
        }
        TknCtl::Network::VirtualSwitchInfoImpl info;
        auto vswitch = info.GetVirtualSwitchByName(name);
        if (!vswitch) {
            output->AddErrorMessage("Unable to find a virtual switch with name " + name);
            return;
        }
        if (input->HasParameter("mtu")) {
            const auto mtu = input->GetParameterInt("mtu");
            if (mtu < 0) {
                output->AddErrorMessage("MTU size should be a positive value");
                return;
            }
            // A value beyond what the switch can take stays beyond it (the host refuses it).
            vswitch->SetMtu(static_cast<int>(std::min<std::int64_t>(mtu, INT_MAX)));
        }
        if (input->HasParameter("cdp-status")) {
            const std::string& status = input->GetParameter("cdp-status");
            int code = 0;
            while (code < 3 && status != kCdpStatus[code])
                ++code;
            vswitch->SetCdpStatus(code);
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

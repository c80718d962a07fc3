#include <limits>

#include "commands/dvs/dvs.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

namespace {

const std::string kParamTimeout = "timeout";
const std::string kParamNicName = "nic-name";
const std::string kParamLagId = "lag-id";
const std::string kParamQbr = "qbr";

}  // namespace

LacpSetTimeout::LacpSetTimeout() {
    Frame::Describe(*this, {"Set long/short timeout for vmnics in one LACP LAG"});
}

InputSpecPtr LacpSetTimeout::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{kParamTimeout, "t", Frame::kBool,
          "Set long or short timeout: 1 for short timeout and 0 for long timeout.", Frame::kRequired},
         {kParamNicName, "n", Frame::kString,
          "The nic name. If it is set, then only this vmnic in the lag will be configured."},
         {kParamLagId, "l", Frame::kInt, "The ID of LAG to be configured.", Frame::kRequired},
         {kParamQbr, "s", Frame::kString, "The name of QBR.", Frame::kRequired}});
}

OutputSpecPtr LacpSetTimeout::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void LacpSetTimeout::ExecuteInternal(InputPtr input, OutputPtr output) {
    if (!input->HasParameter(kParamTimeout)) {
        output->AddErrorMessage("Timeout is empty");
        return;
    }
    const bool shortTimeout = input->GetParameterBool(kParamTimeout);
    Frame::HostCall(output, [&] {
        if (!input->HasParameter(kParamQbr)) {
            output->AddErrorMessage("QBR name is empty");
            return;
        }
        const std::string& qbr = input->GetParameter(kParamQbr);
        auto dvs = HostCtl::Network::NetworkFactory::GetDVSwitchByName(qbr);
        if (!dvs) Frame::Fail(Dvs::UnknownSwitchMessage(qbr));

        if (!input->HasParameter(kParamLagId)) {
            output->AddErrorMessage("LAG ID is empty");
            return;
        }
        const std::int64_t lagId = input->GetParameterInt(kParamLagId);
        // The switch knows LAG IDs of the host's integer width; anything wider names no LAG.
        if (lagId < std::numeric_limits<int>::min() || lagId > std::numeric_limits<int>::max()) {
            Frame::Fail("Distributed switch " + qbr + " has no LAG with ID " + std::to_string(lagId));
        }
        const std::string nicName =
            input->HasParameter(kParamNicName) ? input->GetParameter(kParamNicName) : "";

        dvs->SetLacpTimeout(static_cast<int>(lagId), shortTimeout, nicName);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

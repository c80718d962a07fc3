// A plug-in for the end-to-end tests: "simtest touch --mode MODE" runs one host-control
// call through the hook and then, by mode, reads the host (read), changes it (ok), changes
// it and reports an error (error) or changes it and fails unexpectedly (throw).
#include <memory>
#include <stdexcept>
#include <string>

#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "model/ipsettings.h"
#include "model/pnics.h"
#include "zorbel/autocli.h"
#include "zorbel/metaobj.h"

namespace {

using namespace Zorbel;

class Touch : public AutoCli::Command {
public:
    Touch() { SetDescription("Touches the simulated host."); }

    std::shared_ptr<CallSpec::InputSpec> GetInputSpecInternal() override {
        auto spec = CallSpec::InputSpec::New();
        auto mode = CallSpec::ParameterSpec::New("mode", 0);
        mode->SetDescription("read, ok, error or throw");
        mode->SetRequired(true);
        spec->AddParameter(mode);
        return spec;
    }
    std::shared_ptr<CallSpec::OutputSpec> GetOutputSpecInternal() override {
        auto spec = CallSpec::OutputSpec::New();
        spec->SetRootObject(MetaObj::MetaBool::New());
        return spec;
    }
    void ExecuteInternal(std::shared_ptr<CallSpec::Input> input,
                         std::shared_ptr<CallSpec::Output> output) override {
        const std::string& mode = input->GetParameter("mode");
        try {
            TknCtl::Lib::Enter("SimTest::Touch", "vmnic0", mode);
        } catch (const HostCtl::Lib::HostCtlException& e) {
            output->AddErrorMessage(e.what());
            return;
        }
        if (mode == "read") {
            output->SetRootObject(
                MetaObj::MetaBool::New(!TknCtl::Lib::Read<TknCtl::Model::PnicsSection>().nics.empty()));
            return;
        }
        auto& settings = TknCtl::Lib::Write<TknCtl::Model::IpSettingsSection>();
        settings.ipv6Enabled = !settings.ipv6Enabled;
        if (mode == "throw") throw std::runtime_error("the test command failed on purpose");
        if (mode == "error") {
            output->AddErrorMessage("changed, with an error");
            return;
        }
        output->SetRootObject(MetaObj::MetaBool::New(true));
    }
};

}  // namespace

extern "C" __attribute__((visibility("default"))) void AutoCli_RegisterNamespaces(
    std::shared_ptr<AutoCli::NamespaceNode>& parent) {
    auto space = AutoCli::Namespace::New();
    space->SetDescription("Test commands of the host-control library.");
    auto touch = std::make_shared<Touch>();
    space->RegisterNamespaceNode(std::static_pointer_cast<AutoCli::NamespaceNode>(touch), "touch");
    parent->RegisterNamespaceNode(space, "simtest");
}

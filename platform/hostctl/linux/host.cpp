#include "host.h"

#include "backend/dns.h"
#include "backend/firewall.h"
#include "backend/interfaces.h"
#include "backend/ipsec.h"
#include "backend/netstacks.h"
#include "backend/nics.h"
#include "backend/routing.h"
#include "backend/switches.h"
#include "core/checkpoint.h"
#include "core/context.h"
#include "network/areas.h"

namespace TknCtl::Linux {

namespace {

class LinuxHost final : public Backend::Host {
public:
    explicit LinuxHost(std::unique_ptr<Context> context) : context_(std::move(context)) {}

    std::string Describe() const override { return "Linux host"; }

    // Each area is made when a command first reaches it.
    Backend::Interfaces& GetInterfaces() override { return Area(interfaces_, MakeInterfaces); }
    Backend::Routing& GetRouting() override { return Area(routing_, MakeRouting); }
    Backend::Dns& GetDns() override { return Area(dns_, MakeDns); }
    Backend::Netstacks& GetNetstacks() override { return Area(netstacks_, MakeNetstacks); }
    Backend::Ipsec& GetIpsec() override { return Area(ipsec_, MakeIpsec); }
    Backend::Firewall& GetFirewall() override { return Area(firewall_, MakeFirewall); }
    Backend::Nics& GetNics() override { return Area(nics_, MakeNics); }
    Backend::Switches& GetSwitches() override { return Area(switches_, MakeSwitches); }

    void Commit() override { context_->Commit(); }
    void Discard() override { context_->Discard(); }
    bool HasChanges() const override { return context_->HasChanges(); }
    void StartDryRun(Backend::DryRunRecorder record) override { context_->StartDryRun(std::move(record)); }

    void ConfirmWithin(unsigned seconds) override { context_->GetCheckpoints().ConfirmWithin(seconds); }
    void BeginAtomic() override { context_->GetCheckpoints().BeginAtomic(); }
    void EndAtomic(bool keep) override { context_->GetCheckpoints().EndAtomic(keep); }
    void ConfirmCheckpoint() override { context_->GetCheckpoints().Confirm(); }
    void RollbackCheckpoint() override { context_->GetCheckpoints().Rollback(); }

private:
    template <class T>
    T& Area(std::unique_ptr<T>& area, std::unique_ptr<T> (*make)(Context&)) {
        // A command that reaches the host hears first of a checkpoint nobody will restore.
        context_->GetCheckpoints().ReportStale();
        if (!area) area = make(*context_);
        return *area;
    }

    std::unique_ptr<Context> context_;
    std::unique_ptr<Backend::Interfaces> interfaces_;
    std::unique_ptr<Backend::Routing> routing_;
    std::unique_ptr<Backend::Dns> dns_;
    std::unique_ptr<Backend::Netstacks> netstacks_;
    std::unique_ptr<Backend::Ipsec> ipsec_;
    std::unique_ptr<Backend::Firewall> firewall_;
    std::unique_ptr<Backend::Nics> nics_;
    std::unique_ptr<Backend::Switches> switches_;
};

}  // namespace

std::unique_ptr<Backend::Host> OpenHost() {
    return std::make_unique<LinuxHost>(std::make_unique<Context>(Config::Load()));
}

}  // namespace TknCtl::Linux

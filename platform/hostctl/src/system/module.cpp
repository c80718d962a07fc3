// Kernel modules of the host. The host knows one loadable module, the firewall's.
#include "backend/firewall.h"
#include "backend/host.h"
#include "core/hook.h"
#include "core/section.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "hostctl/system/firewall.h"
#include "model/firewall.h"

namespace TknCtl::System {

using HostCtl::Lib::HostCtlException;
using Model::FirewallSection;

namespace {

bool IsKnown(const std::string& name) {
    return name == Model::kFirewallModule;
}

}  // namespace

ModuleImpl::ModuleImpl(const std::string& name) : name_(name) {}

ModuleImpl::~ModuleImpl() = default;

void ModuleImpl::Refresh() {
    Lib::Enter("TknCtl::System::ModuleImpl::Refresh", name_);
    if (auto* host = Lib::RealHost()) {
        loaded_ = IsKnown(name_) && host->GetFirewall().Read().loaded;
        return;
    }
    loaded_ = IsKnown(name_) && Lib::Read<FirewallSection>().moduleLoaded;
}

void ModuleImpl::Load(const std::string& options, bool force) {
    Lib::Enter("TknCtl::System::ModuleImpl::Load", name_, Lib::Args(options, force));
    if (!IsKnown(name_))
        throw HostCtlException("Cannot load module " + Lib::Quote(name_) + ": no such module");
    if (!options.empty()) {
        throw HostCtlException("Cannot load module " + Lib::Quote(name_) + ": it takes no options (given " +
                               Lib::Quote(options) + ")");
    }
    if (auto* host = Lib::RealHost()) {
        // The module is the firewall's table: made from what the host remembers of the firewall.
        auto state = host->GetFirewall().Read();
        if (!state.loaded || force) {
            state.loaded = true;
            state.dynamicRules.clear();
            host->GetFirewall().Write(state);
        }
        loaded_ = true;
        SetStale(false);
        return;
    }
    const auto& current = Lib::Read<FirewallSection>();
    if (!current.moduleLoaded || force) {
        // A freshly loaded firewall reads its ruleset configuration: the filters are those of
        // the rulesets, with no dynamic rules.
        auto& section = Lib::Write<FirewallSection>();
        section.moduleLoaded = true;
        section.filtersInstalled = true;
        section.dynamicRules.clear();
    }
    loaded_ = true;
    SetStale(false);
}

void ModuleImpl::Unload() {
    Lib::Enter("TknCtl::System::ModuleImpl::Unload", name_);
    if (!IsKnown(name_))
        throw HostCtlException("Cannot unload module " + Lib::Quote(name_) + ": no such module");
    if (auto* host = Lib::RealHost()) {
        // The table goes, and its filters with it; the host remembers the firewall's state.
        auto state = host->GetFirewall().Read();
        if (!state.loaded)
            throw HostCtlException("Cannot unload module " + Lib::Quote(name_) + ": it is not loaded");
        state.loaded = false;
        state.dynamicRules.clear();
        host->GetFirewall().Write(state);
        loaded_ = false;
        SetStale(false);
        return;
    }
    const auto& current = Lib::Read<FirewallSection>();
    if (!current.moduleLoaded)
        throw HostCtlException("Cannot unload module " + Lib::Quote(name_) + ": it is not loaded");
    if (current.filtersInstalled) {
        throw HostCtlException("Cannot unload module " + Lib::Quote(name_) +
                               ": it is in use (the firewall filters are still installed)");
    }
    Lib::Write<FirewallSection>().moduleLoaded = false;
    loaded_ = false;
    SetStale(false);
}

}  // namespace TknCtl::System

#include "core/context.h"

#include <dirent.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <iostream>

#include "core/checkpoint.h"
#include "core/text.h"
#include "hostctl/exception.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;

Context::Context(Config config) : config_(std::move(config)), document_(config_.statePath) {}

Context::~Context() {
    if (dryRun_) Kernel::SetDryRun({});
}

Checkpoints& Context::GetCheckpoints() {
    if (!checkpoints_) checkpoints_ = std::make_unique<Checkpoints>(*this);
    return *checkpoints_;
}

void Context::RequireUndoable(const std::string& what) {
    GetCheckpoints().RequireUndoable(what);
}

bool Context::HasNetAdmin() {
    // CapEff in /proc/self/status: the effective capabilities as a hexadecimal mask;
    // CAP_NET_ADMIN is bit 12.
    std::ifstream status("/proc/self/status");
    for (std::string line; std::getline(status, line);) {
        if (line.rfind("CapEff:", 0) != 0) continue;
        unsigned long long mask = std::stoull(line.substr(7), nullptr, 16);
        return (mask >> 12) & 1;
    }
    return false;
}

void Context::BeginChange() {
    if (!HasNetAdmin()) throw HostCtlException(kNeedsRoot);
    // A dry run changes nothing: it neither locks the document nor takes a checkpoint.
    if (Kernel::DryRun()) return;
    document_.Lock();
    GetCheckpoints().BeforeChange();
}

void Context::StartDryRun(Kernel::DryRunRecorder record) {
    Kernel::SetDryRun(std::move(record));
    dryRun_ = true;
}

std::vector<std::string> Context::Netstacks() const {
    std::vector<std::string> names;
    if (DIR* dir = opendir(Kernel::kNamedNamespaces)) {
        while (const dirent* entry = readdir(dir)) {
            std::string name = entry->d_name;
            if (name == "." || name == ".." || name == kDefaultNetstack) continue;
            names.push_back(name);
        }
        closedir(dir);
    }
    for (auto& planned : Kernel::PlannedNamespaces()) {
        if (std::find(names.begin(), names.end(), planned) == names.end())
            names.push_back(std::move(planned));
    }
    std::sort(names.begin(), names.end());
    names.insert(names.begin(), kDefaultNetstack);
    return names;
}

bool Context::HasNetstack(const std::string& netstack) const {
    if (netstack.empty() || netstack == kDefaultNetstack) return true;
    if (netstack.find('/') != std::string::npos || netstack == "." || netstack == "..") return false;
    if (Kernel::IsPlannedNamespace(netstack)) return true;
    std::string path = std::string(Kernel::kNamedNamespaces) + "/" + netstack;
    return access(path.c_str(), F_OK) == 0;
}

Kernel::Namespace Context::NamespaceOf(const std::string& netstack) const {
    if (netstack.empty() || netstack == kDefaultNetstack) return Kernel::Namespace::Own();
    if (!HasNetstack(netstack))
        throw HostCtlException("Netstack instance " + Lib::Quote(netstack) + " does not exist");
    return Kernel::Namespace::Named(netstack);
}

void Context::Warn(const std::string& text) {
    if (!warned_.insert(text).second) return;
    std::cerr << "Warning: " << text << '\n';
}

}  // namespace TknCtl::Linux

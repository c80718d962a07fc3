// Which host the current session manages, and loading the modules of real hosts.
#include "core/backend.h"

#include <dlfcn.h>

#include <cstdlib>
#include <stdexcept>

#include "backend/dns.h"
#include "backend/firewall.h"
#include "backend/host.h"
#include "backend/interfaces.h"
#include "backend/ipsec.h"
#include "backend/netstacks.h"
#include "backend/nics.h"
#include "backend/routing.h"
#include "backend/switches.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "hostctl/session.h"

namespace TknCtl::Backend {

Host::~Host() = default;

namespace {

[[noreturn]] void KeepsNoCheckpoints(const Host& host) {
    throw HostCtl::Lib::HostCtlException("The " + host.Describe() + " keeps no checkpoints");
}

}  // namespace

void Host::ConfirmWithin(unsigned) {
    KeepsNoCheckpoints(*this);
}
void Host::BeginAtomic() {
    KeepsNoCheckpoints(*this);
}
void Host::EndAtomic(bool) {
    KeepsNoCheckpoints(*this);
}
void Host::ConfirmCheckpoint() {
    KeepsNoCheckpoints(*this);
}
void Host::RollbackCheckpoint() {
    KeepsNoCheckpoints(*this);
}
Interfaces::~Interfaces() = default;
Routing::~Routing() = default;
Dns::~Dns() = default;
Netstacks::~Netstacks() = default;
Ipsec::~Ipsec() = default;
Firewall::~Firewall() = default;
Nics::~Nics() = default;
Switches::~Switches() = default;

namespace {

// The directory this library was loaded from: the modules of real hosts lie beside it.
std::string LibraryDirectory() {
    Dl_info info{};
    if (dladdr(reinterpret_cast<void*>(&LibraryDirectory), &info) == 0 || !info.dli_fname) return ".";
    std::string path = info.dli_fname;
    auto slash = path.rfind('/');
    return slash == std::string::npos ? std::string(".") : path.substr(0, slash);
}

}  // namespace

std::unique_ptr<Host> OpenLinuxHost() {
    using HostCtl::Lib::StateFileError;
    // Loaded once and kept: the host's objects and their code live in the module.
    static void* module = nullptr;
    if (!module) {
        std::string path = LibraryDirectory() + "/libhostctl-linux.so";
        module = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
        if (!module) {
            const char* why = dlerror();
            throw StateFileError("the Linux host is not available: cannot load " + path + ": " +
                                 (why ? why : "unknown error"));
        }
    }
    using Open = Host* (*)();
    auto open = reinterpret_cast<Open>(dlsym(module, "HostCtlLinux_OpenHost"));
    if (!open) throw StateFileError("the Linux host is not available: its module has no entry point");
    return std::unique_ptr<Host>(open());
}

}  // namespace TknCtl::Backend

namespace HostCtl::Lib {

BackendKind ResolveBackend(const std::string& given) {
    std::string name = given;
    std::string origin = "--backend";
    if (name.empty()) {
        if (const char* env = std::getenv("HADRO_BACKEND"); env && *env) {
            name = env;
            origin = "HADRO_BACKEND";
        }
    }
    if (name.empty() || name == "simulated") return BackendKind::kSimulated;
    if (name == "linux") return BackendKind::kLinux;
    throw std::invalid_argument(origin + ": unknown host " + TknCtl::Lib::Quote(name) +
                                " (choose simulated or linux)");
}

}  // namespace HostCtl::Lib

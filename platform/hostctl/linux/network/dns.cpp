// The resolver configuration of the Linux host's netstacks: resolv.conf of each namespace.
#include <memory>

#include "backend/dns.h"
#include "core/context.h"
#include "hostctl/exception.h"
#include "kernel/resolv.h"
#include "network/areas.h"

namespace TknCtl::Linux {

namespace {

using HostCtl::Lib::HostCtlException;

class LinuxDns final : public Backend::Dns {
public:
    explicit LinuxDns(Context& context) : context_(context) {}

    void Read(const std::string& netstack, std::vector<std::string>& servers,
              std::vector<std::string>& searchDomains) override {
        auto config = Kernel::ParseResolvConf(Kernel::ReadResolvConf(PathOf(netstack)));
        servers = std::move(config.servers);
        searchDomains = std::move(config.searchDomains);
    }

    void Write(const std::string& netstack, const std::vector<std::string>& servers,
               const std::vector<std::string>& searchDomains) override {
        std::string path = PathOf(netstack);
        std::string text = Kernel::ReadResolvConf(path);
        auto current = Kernel::ParseResolvConf(text);
        if (current.servers == servers && current.searchDomains == searchDomains) return;
        if (std::string manager = Kernel::ResolvConfManager(path); !manager.empty()) {
            throw HostCtlException(path + " is managed by " + manager +
                                   ": change the resolver configuration through " + manager);
        }
        context_.BeginChange();
        Kernel::WriteResolvConf(path, Kernel::UpdateResolvConf(text, {servers, searchDomains}));
        if (Kernel::DryRun()) return;  // nothing written to read back
        auto written = Kernel::ParseResolvConf(Kernel::ReadResolvConf(path));
        if (written.servers != servers || written.searchDomains != searchDomains)
            throw HostCtlException(path + " does not hold the configuration written to it");
    }

private:
    std::string PathOf(const std::string& netstack) const {
        return Kernel::ResolvConfPath(context_.NamespaceOf(netstack).Name());
    }

    Context& context_;
};

}  // namespace

std::unique_ptr<Backend::Dns> MakeDns(Context& context) {
    return std::make_unique<LinuxDns>(context);
}

}  // namespace TknCtl::Linux

// Not yet available on the Linux host: every operation of the area is refused.
#include <memory>

#include "backend/firewall.h"
#include "core/context.h"
#include "network/areas.h"

namespace TknCtl::Linux {

namespace {

class LinuxFirewall final : public Backend::Firewall {};

}  // namespace

std::unique_ptr<Backend::Firewall> MakeFirewall(Context&) {
    return std::make_unique<LinuxFirewall>();
}

}  // namespace TknCtl::Linux

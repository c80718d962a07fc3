// Not yet available on the Linux host: every operation of the area is refused.
#include <memory>

#include "backend/ipsec.h"
#include "core/context.h"
#include "network/areas.h"

namespace TknCtl::Linux {

namespace {

class LinuxIpsec final : public Backend::Ipsec {};

}  // namespace

std::unique_ptr<Backend::Ipsec> MakeIpsec(Context&) {
    return std::make_unique<LinuxIpsec>();
}

}  // namespace TknCtl::Linux

// Not yet available on the Linux host: every operation of the area is refused.
#include <memory>

#include "backend/nics.h"
#include "core/context.h"
#include "network/areas.h"

namespace TknCtl::Linux {

namespace {

class LinuxNics final : public Backend::Nics {};

}  // namespace

std::unique_ptr<Backend::Nics> MakeNics(Context&) {
    return std::make_unique<LinuxNics>();
}

}  // namespace TknCtl::Linux

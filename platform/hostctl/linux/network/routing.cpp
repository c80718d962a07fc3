// Not yet available on the Linux host: every operation of the area is refused.
#include <memory>

#include "backend/routing.h"
#include "core/context.h"
#include "network/areas.h"

namespace TknCtl::Linux {

namespace {

class LinuxRouting final : public Backend::Routing {};

}  // namespace

std::unique_ptr<Backend::Routing> MakeRouting(Context&) {
    return std::make_unique<LinuxRouting>();
}

}  // namespace TknCtl::Linux

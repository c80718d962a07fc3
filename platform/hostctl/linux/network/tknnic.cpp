// Not yet available on the Linux host: every operation of the area is refused.
#include <memory>

#include "backend/interfaces.h"
#include "core/context.h"
#include "network/areas.h"

namespace TknCtl::Linux {

namespace {

class LinuxInterfaces final : public Backend::Interfaces {};

}  // namespace

std::unique_ptr<Backend::Interfaces> MakeInterfaces(Context&) {
    return std::make_unique<LinuxInterfaces>();
}

}  // namespace TknCtl::Linux

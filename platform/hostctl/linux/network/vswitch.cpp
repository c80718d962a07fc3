// Not yet available on the Linux host: every operation of the area is refused.
#include <memory>

#include "backend/switches.h"
#include "core/context.h"
#include "network/areas.h"

namespace TknCtl::Linux {

namespace {

class LinuxSwitches final : public Backend::Switches {};

}  // namespace

std::unique_ptr<Backend::Switches> MakeSwitches(Context&) {
    return std::make_unique<LinuxSwitches>();
}

}  // namespace TknCtl::Linux

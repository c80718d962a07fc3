// Not yet available on the Linux host: every operation of the area is refused.
#include <memory>

#include "backend/netstacks.h"
#include "core/context.h"
#include "network/areas.h"

namespace TknCtl::Linux {

namespace {

class LinuxNetstacks final : public Backend::Netstacks {};

}  // namespace

std::unique_ptr<Backend::Netstacks> MakeNetstacks(Context&) {
    return std::make_unique<LinuxNetstacks>();
}

}  // namespace TknCtl::Linux

// ENS contexts on the Linux host: the kernel has no such thing, so every request is refused.
#include "hostctl/exception.h"
#include "network/vswitch.h"

namespace TknCtl::Linux {

void LinuxSwitches::RequireEns() {
    throw HostCtl::Lib::HostCtlException("ENS contexts are not available on a Linux host");
}

}  // namespace TknCtl::Linux

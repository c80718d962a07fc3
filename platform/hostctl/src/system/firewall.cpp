// The host firewall.
#include "core/hook.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"

namespace HostCtl {

std::unique_ptr<System::SystemInfo> Host::GetSystemInfo() {
    TknCtl::Lib::Enter("HostCtl::Host::GetSystemInfo");
    throw Lib::HostCtlException("The firewall is not available");
}

}  // namespace HostCtl

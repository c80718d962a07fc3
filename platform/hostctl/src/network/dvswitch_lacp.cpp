// LACP on distributed switches.
#include "core/hook.h"
#include "hostctl/exception.h"
#include "hostctl/network/dvs.h"

namespace TknCtl::Network {

HostCtl::Network::LacpConfig DVSwitchImpl::GetLacpConfig() const {
    Lib::Enter("HostCtl::Network::DVSwitch::GetLacpConfig", name_);
    throw HostCtl::Lib::HostCtlException("LACP configuration is not available");
}

std::vector<HostCtl::Network::LacpStatus> DVSwitchImpl::GetLacpStatus() const {
    Lib::Enter("HostCtl::Network::DVSwitch::GetLacpStatus", name_);
    throw HostCtl::Lib::HostCtlException("LACP status is not available");
}

void DVSwitchImpl::SetLacpTimeout(int lagId, bool shortTimeout, const std::string& nicName) {
    Lib::Enter("HostCtl::Network::DVSwitch::SetLacpTimeout", name_, Lib::Args(lagId, shortTimeout, nicName));
    throw HostCtl::Lib::HostCtlException("LACP timeout cannot be set");
}

}  // namespace TknCtl::Network

// Tarkon network interfaces.
#include "core/hook.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"

namespace TknCtl::Network {

std::unique_ptr<HostCtl::Network::TarkonNicInfo> NetworkInfoImpl::GetTarkonNicInfo() {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetTarkonNicInfo");
    throw HostCtl::Lib::HostCtlException("Tarkon interfaces are not available");
}

}  // namespace TknCtl::Network

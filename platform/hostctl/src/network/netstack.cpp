// Netstack instances.
#include "core/hook.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"

namespace TknCtl::Network {

void NetworkInfoImpl::AddNetstackInstance(HostCtl::Network::NetstackInstance*, bool disabled) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::AddNetstackInstance", {}, Lib::Args(disabled));
    throw HostCtl::Lib::HostCtlException("Netstack instances are not available");
}

std::vector<std::unique_ptr<HostCtl::Network::NetstackInstance>> NetworkInfoImpl::ListNetstackInstances() {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::ListNetstackInstances");
    throw HostCtl::Lib::HostCtlException("Netstack instances are not available");
}

std::unique_ptr<HostCtl::Network::NetstackInstance> NetworkInfoImpl::LookupNetstackInstanceByKey(
    const std::string& key) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::LookupNetstackInstanceByKey", key);
    throw HostCtl::Lib::HostCtlException("Netstack instances are not available");
}

void NetworkInfoImpl::RemoveNetstackInstance(const std::string& key, bool force) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::RemoveNetstackInstance", key, Lib::Args(force));
    throw HostCtl::Lib::HostCtlException("Netstack instances are not available");
}

}  // namespace TknCtl::Network

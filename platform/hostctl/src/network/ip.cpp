// Global IP settings and connections.
#include "core/hook.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"

namespace TknCtl::Network {

bool NetworkInfoImpl::IsTknIpv6Enabled() {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::IsTknIpv6Enabled");
    throw HostCtl::Lib::HostCtlException("IP settings are not available");
}

void NetworkInfoImpl::SetTknIpv6Enabled(bool enabled) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::SetTknIpv6Enabled", {}, Lib::Args(enabled));
    throw HostCtl::Lib::HostCtlException("IP settings are not available");
}

void NetworkInfoImpl::GetCurrentTcpTarkonConnections(std::vector<HostCtl::Network::TcpIpConnection>&,
                                                     const std::string& netstack) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetCurrentTcpTarkonConnections", netstack);
    throw HostCtl::Lib::HostCtlException("Connections are not available");
}

void NetworkInfoImpl::GetCurrentUdpTarkonConnections(std::vector<HostCtl::Network::TcpIpConnection>&,
                                                     const std::string& netstack) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetCurrentUdpTarkonConnections", netstack);
    throw HostCtl::Lib::HostCtlException("Connections are not available");
}

void NetworkInfoImpl::GetCurrentIpTarkonConnections(std::vector<HostCtl::Network::TcpIpConnection>&,
                                                    const std::string& netstack) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetCurrentIpTarkonConnections", netstack);
    throw HostCtl::Lib::HostCtlException("Connections are not available");
}

}  // namespace TknCtl::Network

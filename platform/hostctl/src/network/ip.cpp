// Global IP settings and connections.
#include "hostctl/network/ip.h"
#include "backend/host.h"
#include "backend/netstacks.h"
#include "core/hook.h"
#include "core/section.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"
#include "model/connections.h"
#include "model/ipsettings.h"
#include "model/netstacks.h"

namespace TknCtl::Network {

namespace {

// The sockets of one class on a netstack; IPv6 sockets exist only while IPv6 is on.
void Connections(std::uint32_t protocol, std::vector<HostCtl::Network::TcpIpConnection>& out,
                 const std::string& netstack) {
    if (auto* host = Lib::RealHost()) {
        static constexpr Backend::ConnectionClass kClasses[] = {
            Backend::ConnectionClass::kTcp, Backend::ConnectionClass::kUdp, Backend::ConnectionClass::kIp};
        auto connections = host->GetNetstacks().Connections(netstack, kClasses[protocol]);
        out.insert(out.end(), std::make_move_iterator(connections.begin()),
                   std::make_move_iterator(connections.end()));
        return;
    }
    if (!Lib::Read<Model::NetstacksSection>().Find(netstack))
        throw HostCtl::Lib::HostCtlException("Netstack instance " + Lib::Quote(netstack) + " does not exist");
    const auto* stack = Lib::Read<Model::ConnectionsSection>().Find(netstack);
    if (!stack) return;
    bool ipv6 = Lib::Read<Model::IpSettingsSection>().ipv6Enabled;
    for (const auto& c : stack->connections) {
        if (c.protocol != protocol) continue;
        if (!ipv6 && c.localAddress.find(':') != std::string::npos) continue;
        out.push_back({c.recvQ, c.sendQ, c.localAddress, c.localPort, c.foreignAddress, c.foreignPort,
                       c.state, c.worldId, c.ccAlgo});
    }
}

}  // namespace

bool NetworkInfoImpl::IsTknIpv6Enabled() {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::IsTknIpv6Enabled");
    if (auto* host = Lib::RealHost()) return host->GetNetstacks().IsIpv6Enabled();
    return Lib::Read<Model::IpSettingsSection>().ipv6Enabled;
}

void NetworkInfoImpl::SetTknIpv6Enabled(bool enabled) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::SetTknIpv6Enabled", {}, Lib::Args(enabled));
    if (auto* host = Lib::RealHost()) return host->GetNetstacks().SetIpv6EnabledEverywhere(enabled);
    if (Lib::Read<Model::IpSettingsSection>().ipv6Enabled != enabled)
        Lib::Write<Model::IpSettingsSection>().ipv6Enabled = enabled;
}

void NetworkInfoImpl::GetCurrentTcpTarkonConnections(std::vector<HostCtl::Network::TcpIpConnection>& out,
                                                     const std::string& netstack) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetCurrentTcpTarkonConnections", netstack);
    Connections(0, out, netstack);
}

void NetworkInfoImpl::GetCurrentUdpTarkonConnections(std::vector<HostCtl::Network::TcpIpConnection>& out,
                                                     const std::string& netstack) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetCurrentUdpTarkonConnections", netstack);
    Connections(1, out, netstack);
}

void NetworkInfoImpl::GetCurrentIpTarkonConnections(std::vector<HostCtl::Network::TcpIpConnection>& out,
                                                    const std::string& netstack) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetCurrentIpTarkonConnections", netstack);
    Connections(2, out, netstack);
}

}  // namespace TknCtl::Network

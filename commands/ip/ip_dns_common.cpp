// Steps the DNS commands share.
#include "commands/ip/ip.h"

namespace TalvexCli::NetworkNamespace::IpServices {

std::unique_ptr<HostCtl::Network::IpAddress> DnsServerAddress(const std::string& text,
                                                              const OutputPtr& output) {
    if (HostCtl::Network::Ipv4Address::IsValidAddress(text))
        return std::make_unique<HostCtl::Network::Ipv4Address>(text);
    if (HostCtl::Network::Ipv6Address::IsValidAddress(text))
        return std::make_unique<HostCtl::Network::Ipv6Address>(text);
    output->AddErrorMessage("The specified address '" + text + "' is not recognised as a valid IP address");
    return nullptr;
}

}  // namespace TalvexCli::NetworkNamespace::IpServices

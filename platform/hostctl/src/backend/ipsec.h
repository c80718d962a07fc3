// IPsec security associations and policies of a real host.
//
// The operations (TknCtl::Network::IpSecConfigImpl) keep the rules both hosts share: names,
// SPIs, algorithms, keys, ports and the duplicate checks, the latter against what ListSas and
// ListSps report. An area reads what the host holds and carries out or refuses a change.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "hostctl/network/ipsec.h"

namespace TknCtl::Backend {

class Ipsec {
public:
    virtual ~Ipsec();

    // Every security association in the host's order, keys left empty. One the host made
    // without a name (by key exchange) is automatic and named "auto". For a listing (shown)
    // the host also tells the user what it holds that the commands cannot show; otherwise the
    // list serves the checks of a change, and the host may refuse the change already.
    virtual std::vector<HostCtl::Network::IpSecSadParam> ListSas(bool shown) = 0;
    // Adds an association (the operation's checks have passed: its name and its source,
    // destination and SPI are new); throws HostCtlException when the host refuses it.
    virtual void AddSa(const HostCtl::Network::IpSecSadParam& sa) = 0;
    // Removes the named association / the automatic one of that source, destination and SPI /
    // every association; the operation has checked that they exist.
    virtual void RemoveSa(const std::string& name) = 0;
    virtual void RemoveAutoSa(const HostCtl::Network::Ipv6Address& source,
                              const HostCtl::Network::Ipv6Address& destination, std::uint32_t spi) = 0;
    virtual void FlushSas() = 0;

    // Every security policy in the host's order; a policy whose named association is gone
    // reports the SA name "UNKNOWN".
    virtual std::vector<HostCtl::Network::IpSecSpdParam> ListSps(bool shown) = 0;
    // Adds a policy (its name is new; its SA name is empty or names an association of
    // ListSas that is not automatic).
    virtual void AddSp(const HostCtl::Network::IpSecSpdParam& sp) = 0;
    virtual void RemoveSp(const std::string& name) = 0;
    virtual void FlushSps() = 0;
};

}  // namespace TknCtl::Backend

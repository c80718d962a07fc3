// libFuzzer target: the address and network parsers of the host model (MAC, IPv4, IPv6,
// "address/prefix" networks and firewall allowed-list entries). Whatever the text, a parser
// either accepts it or throws HostCtlException, its validity check agrees with it, and what
// it accepts prints back to text that parses to the same value.
#include <cstddef>
#include <cstdint>
#include <string>

#include "hostctl/exception.h"
#include "hostctl/network/types.h"
#include "model/firewall.h"

namespace {

using HostCtl::Lib::HostCtlException;
using namespace HostCtl::Network;

[[noreturn]] void Fault() { __builtin_trap(); }

template <class T>
bool Parses(const std::string& text, T& value) {
    try {
        value = T(text);
        return true;
    } catch (const HostCtlException&) {
        return false;
    }
}

void CheckMac(const std::string& text) {
    MacAddress mac;
    bool parsed = Parses(text, mac);
    if (parsed != MacAddress::IsWellFormed(text)) Fault();
    if (!parsed) {
        if (MacAddress::IsValid(text)) Fault();
        return;
    }
    if (MacAddress::IsValid(text) != (mac.IsUnicast() && !mac.IsZero())) Fault();
    MacAddress again(mac.GetStringAddress());
    if (again != mac || again.GetStringAddress() != mac.GetStringAddress()) Fault();
}

void CheckIpv4(const std::string& text) {
    Ipv4Address address;
    bool parsed = Parses(text, address);
    if (parsed != Ipv4Address::IsValidAddress(text)) Fault();
    if (parsed && Ipv4Address(address.GetStringAddress()) != address) Fault();

    Ipv4Network network;
    parsed = Parses(text, network);
    if (parsed != Ipv4Network::IsValidAddressAndNetmask(text)) Fault();
    if (parsed) {
        if (network.GetPrefixLength() > 32) Fault();
        Ipv4Network again(network.GetStringAddress());
        if (again != network) Fault();
        if (!network.Contains(network.GetAddress()) || !network.Contains(network.GetNetwork())) Fault();
        if (!network.GetNetmask().IsNetmask()) Fault();
    }
}

void CheckIpv6(const std::string& text) {
    Ipv6Address address;
    bool parsed = Parses(text, address);
    if (parsed != Ipv6Address::IsValidAddress(text)) Fault();
    if (parsed && Ipv6Address(address.GetStringAddress()) != address) Fault();

    Ipv6Network network;
    parsed = Parses(text, network);
    if (parsed != Ipv6Network::IsValidAddressAndNetmask(text)) Fault();
    if (parsed) {
        if (network.GetNetmask() > 128) Fault();
        Ipv6Network again(network.GetStringAddress());
        if (again != network) Fault();
        if (!network.Contains(network.GetAddress()) || !network.Contains(network.GetNetwork())) Fault();
    }
}

void CheckAllowedIp(const std::string& text) {
    auto entry = TknCtl::Model::ParseAllowedIp(text);
    if (entry.has_value() != TknCtl::Model::IsAllowedIpText(text)) Fault();
    if (!entry) return;
    // The canonical text is an entry of the same kind whose canonical text is itself.
    auto again = TknCtl::Model::ParseAllowedIp(entry->text);
    if (!again || again->kind != entry->kind || again->text != entry->text) Fault();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string text(reinterpret_cast<const char*>(data), size);
    CheckMac(text);
    CheckIpv4(text);
    CheckIpv6(text);
    CheckAllowedIp(text);
    return 0;
}

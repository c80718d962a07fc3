#include "model/values.h"

namespace TknCtl::Model {

using namespace HostCtl::Network;

MacAddress ReadMac(const Json::In& in) {
    std::string text = in.Str();
    if (!MacAddress::IsWellFormed(text)) in.Fail("invalid MAC address " + Lib::Quote(text));
    return MacAddress(text);
}

Ipv4Address ReadIpv4(const Json::In& in) {
    std::string text = in.Str();
    if (!Ipv4Address::IsValidAddress(text)) in.Fail("invalid IPv4 address " + Lib::Quote(text));
    return Ipv4Address(text);
}

Ipv6Address ReadIpv6(const Json::In& in) {
    std::string text = in.Str();
    if (!Ipv6Address::IsValidAddress(text)) in.Fail("invalid IPv6 address " + Lib::Quote(text));
    return Ipv6Address(text);
}

Ipv4Network ReadIpv4Network(const Json::In& in) {
    std::string text = in.Str();
    if (!Ipv4Network::IsValidAddressAndNetmask(text)) in.Fail("invalid IPv4 network " + Lib::Quote(text));
    return Ipv4Network(text);
}

Ipv6Network ReadIpv6Network(const Json::In& in) {
    std::string text = in.Str();
    if (!Ipv6Network::IsValidAddressAndNetmask(text)) in.Fail("invalid IPv6 network " + Lib::Quote(text));
    return Ipv6Network(text);
}

bool IsIpAddressText(const std::string& text) {
    return Ipv4Address::IsValidAddress(text) || Ipv6Address::IsValidAddress(text);
}

}  // namespace TknCtl::Model

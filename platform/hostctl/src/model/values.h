// Reading and checking the library's value types inside sections (internal).
#pragma once

#include <set>
#include <string>

#include "core/json_io.h"
#include "core/section.h"
#include "core/text.h"
#include "hostctl/network/types.h"

namespace TknCtl::Model {

HostCtl::Network::MacAddress ReadMac(const Json::In& in);
HostCtl::Network::Ipv4Address ReadIpv4(const Json::In& in);
HostCtl::Network::Ipv6Address ReadIpv6(const Json::In& in);
HostCtl::Network::Ipv4Network ReadIpv4Network(const Json::In& in);
HostCtl::Network::Ipv6Network ReadIpv6Network(const Json::In& in);
// An IPv4 or IPv6 address as text.
bool IsIpAddressText(const std::string& text);

// Fails when two items give the same key; what names the kind of key ("NIC name").
template <class Items, class Key>
void RequireUnique(const Items& items, Key key, Lib::Checker& checker, const char* what) {
    std::set<std::string> seen;
    for (const auto& item : items) {
        std::string value = key(item);
        if (!seen.insert(value).second)
            checker.Fail("duplicate " + std::string(what) + " " + Lib::Quote(value));
    }
}

// Fails when name is empty.
inline void RequireName(const std::string& name, Lib::Checker& checker, const char* what) {
    if (name.empty()) checker.Fail(std::string("empty ") + what);
}

}  // namespace TknCtl::Model

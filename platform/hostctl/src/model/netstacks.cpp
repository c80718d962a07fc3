#include "model/netstacks.h"

#include <algorithm>
#include <iterator>

#include "model/values.h"

namespace TknCtl::Model {

const Netstack* NetstacksSection::Find(const std::string& key) const {
    for (const auto& netstack : netstacks) {
        if (netstack.key == key) return &netstack;
    }
    return nullptr;
}

Netstack* NetstacksSection::Find(const std::string& key) {
    return const_cast<Netstack*>(static_cast<const NetstacksSection*>(this)->Find(key));
}

namespace {

void Load(const Json::In& in, NetstacksSection& section) {
    in.Elements([&](const Json::In& item) {
        Netstack n;
        n.key = item.Str("key");
        n.name = item.Str("name", n.key);
        n.state = item.Int<std::uint32_t>("state", kNetstackEnabled);
        n.maxConnections = item.Int<std::uint32_t>("maxConnections", n.maxConnections);
        n.currentMaxConnections = item.Int<std::uint32_t>("currentMaxConnections", n.maxConnections);
        n.congestionControl = item.Str("congestionControl", n.congestionControl);
        n.ipv6Enabled = item.Bool("ipv6Enabled", true);
        n.currentIpv6Enabled = item.Bool("currentIpv6Enabled", n.ipv6Enabled);
        item.Done();
        section.netstacks.push_back(std::move(n));
    });
}

Json::Node Save(const NetstacksSection& section) {
    Json::Node out = Json::Node::array();
    for (const auto& n : section.netstacks) {
        out.push_back({{"key", n.key},
                       {"name", n.name},
                       {"state", n.state},
                       {"maxConnections", n.maxConnections},
                       {"currentMaxConnections", n.currentMaxConnections},
                       {"congestionControl", n.congestionControl},
                       {"ipv6Enabled", n.ipv6Enabled},
                       {"currentIpv6Enabled", n.currentIpv6Enabled}});
    }
    return out;
}

void Check(const NetstacksSection& section, Lib::Checker& checker) {
    RequireUnique(
        section.netstacks, [](const Netstack& n) { return n.key; }, checker, "netstack key");
    for (const auto& n : section.netstacks) {
        RequireName(n.key, checker, "netstack key");
        if (std::find_if(std::begin(kCongestionControlAlgorithms), std::end(kCongestionControlAlgorithms),
                         [&](const char* name) { return n.congestionControl == name; }) ==
            std::end(kCongestionControlAlgorithms)) {
            checker.Fail("netstack " + Lib::Quote(n.key) + ": unknown congestion-control algorithm " +
                         Lib::Quote(n.congestionControl));
        }
    }
}

}  // namespace

const Lib::SectionKind& NetstacksSection::Kind() {
    static const Json::JsonSection<NetstacksSection> kind("netstacks", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model

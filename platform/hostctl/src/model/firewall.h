// Section "firewall": the host firewall's module state, switches, rulesets and dynamic rules.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "core/section.h"

namespace TknCtl::Model {

// A port rule. Codes as the library reports them: port type 1 destination, 0 source;
// direction 0 inbound, 1 outbound; protocol 0 TCP, 1 UDP.
struct FirewallRule {
    std::uint32_t portType = 1;
    std::uint32_t portBegin = 0;
    std::uint32_t portEnd = 0;
    std::uint32_t direction = 0;
    std::uint32_t protocol = 0;
};

struct Ruleset {
    std::string id;  // "sshServer"; also its name
    bool enabled = false;
    bool allowedAll = true;
    std::vector<std::string> allowedIps;  // addresses and networks (IPv4 or IPv6) as text
    std::vector<FirewallRule> rules;
    std::int32_t clientCount = 0;
};

struct FirewallSection {
    static const Lib::SectionKind& Kind();
    bool moduleLoaded = true;  // the "hadrofw" module
    // The ruleset configuration is loaded into the data path. Only while the module is
    // loaded; dynamic rules only while the filters are installed.
    bool filtersInstalled = true;
    bool enabled = true;
    bool defaultActionPass = false;  // false: DROP
    std::vector<Ruleset> rulesets;
    std::vector<FirewallRule> dynamicRules;

    const Ruleset* Find(const std::string& id) const;
    Ruleset* Find(const std::string& id);
};

// The name of the firewall's kernel module.
inline constexpr const char* kFirewallModule = "hadrofw";

// True when text is an IPv4 or IPv6 address or network ("address/prefix").
bool IsAllowedIpText(const std::string& text);

// An entry of an allowed list: its kind and its canonical text (addresses as the host prints
// them, networks with their host bits cleared). Two entries are the same when their
// canonical texts are.
enum class AllowedIpKind { kIpv4Address, kIpv4Network, kIpv6Address, kIpv6Network };
struct AllowedIp {
    AllowedIpKind kind;
    std::string text;
};
// Nothing when text is not an address or network.
std::optional<AllowedIp> ParseAllowedIp(const std::string& text);

}  // namespace TknCtl::Model

// Section "firewall": the host firewall's module state, switches, rulesets and dynamic rules.
#pragma once

#include <cstdint>
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
    bool enabled = true;
    bool defaultActionPass = false;  // false: DROP
    std::vector<Ruleset> rulesets;
    std::vector<FirewallRule> dynamicRules;

    const Ruleset* Find(const std::string& id) const;
    Ruleset* Find(const std::string& id);
};

// True when text is an IPv4 or IPv6 address or network ("address/prefix").
bool IsAllowedIpText(const std::string& text);

}  // namespace TknCtl::Model

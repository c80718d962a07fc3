#include "model/firewall.h"

#include "model/values.h"

namespace TknCtl::Model {

using namespace HostCtl::Network;

const Ruleset* FirewallSection::Find(const std::string& id) const {
    for (const auto& ruleset : rulesets) {
        if (ruleset.id == id) return &ruleset;
    }
    return nullptr;
}

Ruleset* FirewallSection::Find(const std::string& id) {
    return const_cast<Ruleset*>(static_cast<const FirewallSection*>(this)->Find(id));
}

bool IsAllowedIpText(const std::string& text) {
    return Ipv4Address::IsValidAddress(text) || Ipv6Address::IsValidAddress(text) ||
           Ipv4Network::IsValidAddressAndNetmask(text) || Ipv6Network::IsValidAddressAndNetmask(text);
}

std::optional<AllowedIp> ParseAllowedIp(const std::string& text) {
    if (Ipv4Address::IsValidAddress(text))
        return AllowedIp{AllowedIpKind::kIpv4Address, Ipv4Address(text).GetStringAddress()};
    if (Ipv6Address::IsValidAddress(text))
        return AllowedIp{AllowedIpKind::kIpv6Address, Ipv6Address(text).GetStringAddress()};
    if (Ipv4Network::IsValidAddressAndNetmask(text)) {
        Ipv4Network network(text);
        return AllowedIp{AllowedIpKind::kIpv4Network,
                         Ipv4Network(network.GetNetwork(), network.GetPrefixLength()).GetStringAddress()};
    }
    if (Ipv6Network::IsValidAddressAndNetmask(text)) {
        Ipv6Network network(text);
        return AllowedIp{AllowedIpKind::kIpv6Network,
                         Ipv6Network(network.GetNetwork(), network.GetNetmask()).GetStringAddress()};
    }
    return std::nullopt;
}

namespace {

using Json::In;
using Json::Node;

const char* const kPortTypes[] = {"src", "dst"};
const char* const kRuleDirections[] = {"inbound", "outbound"};
const char* const kRuleProtocols[] = {"tcp", "udp"};

FirewallRule LoadRule(const In& in) {
    FirewallRule rule;
    rule.portType = Json::NameToCode(in.Member("portType"), kPortTypes);
    rule.portBegin = in.Int<std::uint16_t>("portBegin");
    rule.portEnd = in.Int<std::uint16_t>("portEnd", static_cast<std::uint16_t>(rule.portBegin));
    rule.direction = Json::NameToCode(in.Member("direction"), kRuleDirections);
    rule.protocol = Json::NameToCode(in.Member("protocol"), kRuleProtocols);
    in.Done();
    if (rule.portEnd < rule.portBegin) in.Fail("port range ends before it begins");
    return rule;
}

Node SaveRule(const FirewallRule& rule) {
    return Node{{"portType", rule.portType == 1 ? "dst" : "src"},
                {"portBegin", rule.portBegin},
                {"portEnd", rule.portEnd},
                {"direction", rule.direction == 0 ? "inbound" : "outbound"},
                {"protocol", rule.protocol == 0 ? "tcp" : "udp"}};
}

Node SaveRules(const std::vector<FirewallRule>& rules) {
    Node out = Node::array();
    for (const auto& rule : rules)
        out.push_back(SaveRule(rule));
    return out;
}

void Load(const In& in, FirewallSection& section) {
    section.moduleLoaded = in.Bool("moduleLoaded", true);
    section.filtersInstalled = in.Bool("filtersInstalled", section.moduleLoaded);
    section.enabled = in.Bool("enabled", true);
    if (auto action = in.OptMember("defaultAction")) {
        const char* const actions[] = {"DROP", "PASS"};
        section.defaultActionPass = Json::NameToCode(*action, actions) == 1;
    }
    in.Each("rulesets", [&](const In& item) {
        Ruleset r;
        r.id = item.Str("id");
        r.enabled = item.Bool("enabled", false);
        r.allowedAll = item.Bool("allowedAll", true);
        item.Each("allowedIps", [&](const In& ip) {
            std::string text = ip.Str();
            if (!IsAllowedIpText(text)) ip.Fail("not an address or network: " + Lib::Quote(text));
            r.allowedIps.push_back(text);
        });
        item.Each("rules", [&](const In& rule) { r.rules.push_back(LoadRule(rule)); });
        r.clientCount = item.Int<std::int32_t>("clientCount", 0);
        item.Done();
        section.rulesets.push_back(std::move(r));
    });
    in.Each("dynamicRules", [&](const In& rule) { section.dynamicRules.push_back(LoadRule(rule)); });
    in.Done();
}

Node Save(const FirewallSection& section) {
    Node rulesets = Node::array();
    for (const auto& r : section.rulesets) {
        rulesets.push_back({{"id", r.id},
                            {"enabled", r.enabled},
                            {"allowedAll", r.allowedAll},
                            {"allowedIps", r.allowedIps},
                            {"rules", SaveRules(r.rules)},
                            {"clientCount", r.clientCount}});
    }
    return Node{{"moduleLoaded", section.moduleLoaded},
                {"filtersInstalled", section.filtersInstalled},
                {"enabled", section.enabled},
                {"defaultAction", section.defaultActionPass ? "PASS" : "DROP"},
                {"rulesets", std::move(rulesets)},
                {"dynamicRules", SaveRules(section.dynamicRules)}};
}

void Check(const FirewallSection& section, Lib::Checker& checker) {
    RequireUnique(
        section.rulesets, [](const Ruleset& r) { return r.id; }, checker, "ruleset");
    for (const auto& r : section.rulesets) {
        RequireName(r.id, checker, "ruleset ID");
        if (r.clientCount < 0) checker.Fail("ruleset " + Lib::Quote(r.id) + " has a negative client count");
        RequireUnique(
            r.allowedIps, [](const std::string& text) { return ParseAllowedIp(text)->text; }, checker,
            ("allowed address of ruleset " + Lib::Quote(r.id) + ":").c_str());
    }
    if (section.filtersInstalled && !section.moduleLoaded)
        checker.Fail("firewall filters are installed while the module is not loaded");
    if (!section.dynamicRules.empty() && !section.filtersInstalled)
        checker.Fail("dynamic firewall rules while the firewall filters are not installed");
    for (std::size_t i = 0; i < section.dynamicRules.size(); ++i) {
        for (std::size_t j = 0; j < i; ++j) {
            const auto& a = section.dynamicRules[i];
            const auto& b = section.dynamicRules[j];
            if (a.portType == b.portType && a.portBegin == b.portBegin && a.portEnd == b.portEnd &&
                a.direction == b.direction && a.protocol == b.protocol)
                checker.Fail("duplicate dynamic firewall rule");
        }
    }
}

}  // namespace

const Lib::SectionKind& FirewallSection::Kind() {
    static const Json::JsonSection<FirewallSection> kind("firewall", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model

// The host firewall: its global switches, rulesets, allowed lists, clients and dynamic rules.
#include "hostctl/system/firewall.h"

#include <algorithm>
#include <limits>

#include "core/hook.h"
#include "core/section.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"
#include "model/firewall.h"

namespace HostCtl {

std::unique_ptr<System::SystemInfo> Host::GetSystemInfo() {
    TknCtl::Lib::Enter("HostCtl::Host::GetSystemInfo");
    return std::make_unique<TknCtl::System::SystemInfoImpl>();
}

namespace System {

FirewallRule::~FirewallRule() = default;
FirewallRuleset::~FirewallRuleset() = default;
SystemInfo::~SystemInfo() = default;

}  // namespace System
}  // namespace HostCtl

namespace TknCtl::System {

using HostCtl::Lib::HostCtlException;
using Model::FirewallSection;

namespace {

// The firewall section, for reading, once the module is known to be loaded.
const FirewallSection& Loaded() {
    const auto& section = Lib::Read<FirewallSection>();
    if (!section.moduleLoaded)
        throw HostCtlException(std::string("The firewall module '") + Model::kFirewallModule +
                               "' is not loaded");
    return section;
}

// The same, for changing it.
FirewallSection& LoadedForWrite() {
    Loaded();
    return Lib::Write<FirewallSection>();
}

std::unique_ptr<HostCtl::System::FirewallRule> ToRule(const Model::FirewallRule& rule) {
    return std::make_unique<HostCtl::System::FirewallRule>(rule.portType, rule.portBegin, rule.portEnd,
                                                           rule.direction, rule.protocol);
}

std::vector<std::unique_ptr<HostCtl::System::FirewallRule>> ToRules(
    const std::vector<Model::FirewallRule>& rules) {
    std::vector<std::unique_ptr<HostCtl::System::FirewallRule>> out;
    out.reserve(rules.size());
    for (const auto& rule : rules)
        out.push_back(ToRule(rule));
    return out;
}

bool SameRule(const Model::FirewallRule& a, const Model::FirewallRule& b) {
    return a.portType == b.portType && a.portBegin == b.portBegin && a.portEnd == b.portEnd &&
           a.direction == b.direction && a.protocol == b.protocol;
}

// The rule as journal and message text: "dst 902-902 inbound tcp".
std::string RuleText(const HostCtl::System::FirewallRule& rule) {
    auto code = [](std::uint32_t value, const char* zero, const char* one) {
        return value == 0 ? std::string(zero) : value == 1 ? std::string(one) : std::to_string(value);
    };
    return code(rule.GetPortType(), "src", "dst") + " " + std::to_string(rule.GetPortBegin()) + "-" +
           std::to_string(rule.GetPortEnd()) + " " + code(rule.GetDirection(), "inbound", "outbound") + " " +
           code(rule.GetProtocol(), "tcp", "udp");
}

Model::AllowedIp ParseOrThrow(const std::string& text) {
    auto parsed = Model::ParseAllowedIp(text);
    if (!parsed) {
        throw HostCtlException(
            "Invalid allowed address " + Lib::Quote(text) +
            ": expected an IPv4 or IPv6 address or a network in CIDR form (address/prefix length)");
    }
    return *parsed;
}

// A ruleset by id. It holds only the id and reads the host at each call.
class FirewallRulesetImpl : public HostCtl::System::FirewallRuleset, public Lib::TknCtlObject {
public:
    explicit FirewallRulesetImpl(std::string id) : id_(std::move(id)) {}

    std::string GetName() override { return Get("GetName").id; }
    bool IsEnabled() override { return Get("IsEnabled").enabled; }
    void Enable() override { Change("Enable").enabled = true; }
    void Disable() override { Change("Disable").enabled = false; }
    std::int32_t GetClientCount() override { return Get("GetClientCount").clientCount; }

    void AddClient() override {
        const auto& ruleset = Get("AddClient");
        if (ruleset.clientCount == std::numeric_limits<std::int32_t>::max())
            throw HostCtlException("Ruleset " + Lib::Quote(id_) + " cannot take more clients");
        auto& changed = Writable();
        ++changed.clientCount;
        changed.enabled = true;
    }

    void RemoveClient() override {
        const auto& ruleset = Get("RemoveClient");
        if (ruleset.clientCount <= 0)
            throw HostCtlException("Ruleset " + Lib::Quote(id_) + " has no clients");
        auto& changed = Writable();
        if (--changed.clientCount == 0) changed.enabled = false;
    }

    std::vector<std::unique_ptr<HostCtl::System::FirewallRule>> GetRules() override {
        return ToRules(Get("GetRules").rules);
    }

    std::unique_ptr<HostCtl::System::FirewallAllowedIps> GetAllowedIps() override {
        using namespace HostCtl::Network;
        auto out = std::make_unique<HostCtl::System::FirewallAllowedIps>();
        for (const auto& text : Get("GetAllowedIps").allowedIps) {
            auto entry = Model::ParseAllowedIp(text);
            if (!entry) continue;  // the model refuses such text when it is loaded
            switch (entry->kind) {
                case Model::AllowedIpKind::kIpv4Address:
                    out->AddIpv4Address(Ipv4Address(entry->text));
                    break;
                case Model::AllowedIpKind::kIpv4Network:
                    out->AddIpv4Network(Ipv4Network(entry->text));
                    break;
                case Model::AllowedIpKind::kIpv6Address:
                    out->AddIpv6Address(Ipv6Address(entry->text));
                    break;
                case Model::AllowedIpKind::kIpv6Network:
                    out->AddIpv6Network(Ipv6Network(entry->text));
                    break;
            }
        }
        return out;
    }

    void AddAllowedIp(const std::string& address) override {
        const auto& ruleset = Get("AddAllowedIp", address);
        auto entry = ParseOrThrow(address);
        if (Position(ruleset, entry) != ruleset.allowedIps.size()) {
            throw HostCtlException(Lib::Quote(address) + " is already on the allowed list of ruleset " +
                                   Lib::Quote(id_));
        }
        Writable().allowedIps.push_back(entry.text);
    }

    void RemoveAllowedIp(const std::string& address) override {
        const auto& ruleset = Get("RemoveAllowedIp", address);
        auto entry = ParseOrThrow(address);
        std::size_t at = Position(ruleset, entry);
        if (at == ruleset.allowedIps.size()) {
            throw HostCtlException(Lib::Quote(address) + " is not on the allowed list of ruleset " +
                                   Lib::Quote(id_));
        }
        auto& list = Writable().allowedIps;
        list.erase(list.begin() + static_cast<std::ptrdiff_t>(at));
    }

    bool IsValid() override {
        Enter("IsValid");
        return Loaded().Find(id_) != nullptr;
    }

    void SetAllowedAll(bool allowedAll) override {
        Change("SetAllowedAll", Lib::Args(allowedAll)).allowedAll = allowedAll;
    }
    bool IsAllowedAll() override { return Get("IsAllowedAll").allowedAll; }

private:
    void Enter(const char* operation, const std::string& arguments = {}) const {
        Lib::Enter(std::string("HostCtl::System::FirewallRuleset::") + operation, id_, arguments);
    }

    // Starts an operation and gives the ruleset; throws when it does not exist.
    const Model::Ruleset& Get(const char* operation, const std::string& arguments = {}) const {
        Enter(operation, arguments);
        const auto* ruleset = Loaded().Find(id_);
        if (!ruleset) throw HostCtlException("Ruleset " + Lib::Quote(id_) + " not found");
        return *ruleset;
    }

    Model::Ruleset& Change(const char* operation, const std::string& arguments = {}) {
        Get(operation, arguments);
        return Writable();
    }

    // The ruleset for changing, once Get() has found it.
    Model::Ruleset& Writable() { return *Lib::Write<FirewallSection>().Find(id_); }

    // Where an entry stands on the allowed list; the list's size when it is not there.
    static std::size_t Position(const Model::Ruleset& ruleset, const Model::AllowedIp& entry) {
        for (std::size_t i = 0; i < ruleset.allowedIps.size(); ++i) {
            auto stored = Model::ParseAllowedIp(ruleset.allowedIps[i]);
            if (stored && stored->text == entry.text) return i;
        }
        return ruleset.allowedIps.size();
    }

    std::string id_;
};

}  // namespace

SystemInfoImpl::SystemInfoImpl() = default;
SystemInfoImpl::~SystemInfoImpl() = default;

bool SystemInfoImpl::IsFirewallEnabled() {
    Lib::Enter("TknCtl::System::SystemInfoImpl::IsFirewallEnabled");
    return Loaded().enabled;
}

void SystemInfoImpl::SetFirewallEnabled(bool enabled) {
    Lib::Enter("TknCtl::System::SystemInfoImpl::SetFirewallEnabled", {}, Lib::Args(enabled));
    LoadedForWrite().enabled = enabled;
}

bool SystemInfoImpl::GetFirewallDefaultAction() {
    Lib::Enter("TknCtl::System::SystemInfoImpl::GetFirewallDefaultAction");
    return Loaded().defaultActionPass;
}

void SystemInfoImpl::SetFirewallDefaultAction(bool pass) {
    Lib::Enter("TknCtl::System::SystemInfoImpl::SetFirewallDefaultAction", {}, Lib::Args(pass));
    LoadedForWrite().defaultActionPass = pass;
}

std::vector<std::unique_ptr<HostCtl::System::FirewallRuleset>> SystemInfoImpl::GetFirewallRulesets() {
    Lib::Enter("TknCtl::System::SystemInfoImpl::GetFirewallRulesets");
    std::vector<std::unique_ptr<HostCtl::System::FirewallRuleset>> out;
    for (const auto& ruleset : Loaded().rulesets)
        out.push_back(std::make_unique<FirewallRulesetImpl>(ruleset.id));
    return out;
}

std::unique_ptr<HostCtl::System::FirewallRuleset> SystemInfoImpl::GetFirewallRulesetById(
    const std::string& id) {
    Lib::Enter("TknCtl::System::SystemInfoImpl::GetFirewallRulesetById", id);
    Loaded();
    return std::make_unique<FirewallRulesetImpl>(id);
}

void SystemInfoImpl::LoadFirewallRulesets() {
    Lib::Enter("TknCtl::System::SystemInfoImpl::LoadFirewallRulesets");
    auto& section = LoadedForWrite();
    section.filtersInstalled = true;
    section.dynamicRules.clear();
}

void SystemInfoImpl::DestroyFirewallFilters() {
    Lib::Enter("TknCtl::System::SystemInfoImpl::DestroyFirewallFilters");
    auto& section = LoadedForWrite();
    section.filtersInstalled = false;
    section.dynamicRules.clear();
}

std::vector<std::unique_ptr<HostCtl::System::FirewallRule>> SystemInfoImpl::GetFirewallDynamicRules() {
    Lib::Enter("TknCtl::System::SystemInfoImpl::GetFirewallDynamicRules");
    return ToRules(Loaded().dynamicRules);
}

void SystemInfoImpl::AddFirewallDynamicRule(HostCtl::System::FirewallRule& rule) {
    const std::string text = RuleText(rule);
    Lib::Enter("TknCtl::System::SystemInfoImpl::AddFirewallDynamicRule", {}, text);
    const auto& section = Loaded();
    if (!section.filtersInstalled)
        throw HostCtlException(
            "Cannot add the dynamic rule " + text +
            ": the firewall filters are not installed (load the ruleset configuration first)");
    if (rule.GetPortType() > 1 || rule.GetDirection() > 1 || rule.GetProtocol() > 1 ||
        rule.GetPortEnd() > 65535 || rule.GetPortBegin() > rule.GetPortEnd())
        throw HostCtlException("Invalid dynamic rule " + text);
    Model::FirewallRule added{rule.GetPortType(), rule.GetPortBegin(), rule.GetPortEnd(), rule.GetDirection(),
                              rule.GetProtocol()};
    for (const auto& existing : section.dynamicRules) {
        if (SameRule(existing, added))
            throw HostCtlException("The dynamic rule " + text + " is already installed");
    }
    Lib::Write<FirewallSection>().dynamicRules.push_back(added);
}

}  // namespace TknCtl::System

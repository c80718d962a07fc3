// The host firewall: its global switches, rulesets, allowed lists, clients and dynamic rules.
#include "hostctl/system/firewall.h"

#include <algorithm>
#include <limits>

#include "backend/firewall.h"
#include "backend/host.h"
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

std::string NotLoaded() {
    return std::string("The firewall module '") + Model::kFirewallModule + "' is not loaded";
}

// The firewall section, for reading, once the module is known to be loaded.
const FirewallSection& Loaded() {
    const auto& section = Lib::Read<FirewallSection>();
    if (!section.moduleLoaded) throw HostCtlException(NotLoaded());
    return section;
}

// The allowed addresses of a ruleset, from their texts (addresses and CIDR networks of both
// families; both hosts refuse other text before it is kept).
std::unique_ptr<HostCtl::System::FirewallAllowedIps> AllowedIpsOf(const std::vector<std::string>& texts) {
    using namespace HostCtl::Network;
    auto out = std::make_unique<HostCtl::System::FirewallAllowedIps>();
    for (const auto& text : texts) {
        auto entry = Model::ParseAllowedIp(text);
        if (!entry) continue;
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

// ---------------------------------------------------------------- a real host

// The real host's firewall as it is now, once the module is known to be loaded.
Backend::FirewallState LoadedState(Backend::Host& host) {
    auto state = host.GetFirewall().Read();
    if (!state.loaded) throw HostCtlException(NotLoaded());
    return state;
}

std::vector<std::unique_ptr<HostCtl::System::FirewallRule>> ToRules(
    const std::vector<HostCtl::System::FirewallRule>& rules) {
    std::vector<std::unique_ptr<HostCtl::System::FirewallRule>> out;
    out.reserve(rules.size());
    for (const auto& rule : rules)
        out.push_back(std::make_unique<HostCtl::System::FirewallRule>(rule));
    return out;
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

bool WellFormed(const HostCtl::System::FirewallRule& rule) {
    return rule.GetPortType() <= 1 && rule.GetDirection() <= 1 && rule.GetProtocol() <= 1 &&
           rule.GetPortEnd() <= 65535 && rule.GetPortBegin() <= rule.GetPortEnd();
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
        return AllowedIpsOf(Get("GetAllowedIps").allowedIps);
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

// A ruleset of a real host by id; it reads the host at each call and hands each change to it
// as the whole firewall wanted.
class RealFirewallRuleset : public HostCtl::System::FirewallRuleset, public Lib::TknCtlObject {
public:
    RealFirewallRuleset(Backend::Host& host, std::string id) : host_(host), id_(std::move(id)) {}

    std::string GetName() override { return Get("GetName").name; }
    bool IsEnabled() override { return Get("IsEnabled").enabled; }
    void Enable() override {
        Get("Enable").enabled = true;
        Apply();
    }
    void Disable() override {
        Get("Disable").enabled = false;
        Apply();
    }
    std::int32_t GetClientCount() override { return Get("GetClientCount").clients; }

    void AddClient() override {
        auto& ruleset = Get("AddClient");
        if (ruleset.clients == std::numeric_limits<std::int32_t>::max())
            throw HostCtlException("Ruleset " + Lib::Quote(id_) + " cannot take more clients");
        ++ruleset.clients;
        ruleset.enabled = true;
        Apply();
    }

    void RemoveClient() override {
        auto& ruleset = Get("RemoveClient");
        if (ruleset.clients <= 0) throw HostCtlException("Ruleset " + Lib::Quote(id_) + " has no clients");
        if (--ruleset.clients == 0) ruleset.enabled = false;
        Apply();
    }

    std::vector<std::unique_ptr<HostCtl::System::FirewallRule>> GetRules() override {
        return ToRules(Get("GetRules").rules);
    }

    std::unique_ptr<HostCtl::System::FirewallAllowedIps> GetAllowedIps() override {
        return AllowedIpsOf(Get("GetAllowedIps").allowedIps);
    }

    void AddAllowedIp(const std::string& address) override {
        auto& ruleset = Get("AddAllowedIp", address);
        const std::string entry = HostText(ParseOrThrow(address));
        auto& list = ruleset.allowedIps;
        if (std::find(list.begin(), list.end(), entry) != list.end()) {
            throw HostCtlException(Lib::Quote(address) + " is already on the allowed list of ruleset " +
                                   Lib::Quote(id_));
        }
        list.push_back(entry);
        Apply();
    }

    void RemoveAllowedIp(const std::string& address) override {
        auto& ruleset = Get("RemoveAllowedIp", address);
        const std::string entry = HostText(ParseOrThrow(address));
        auto& list = ruleset.allowedIps;
        auto it = std::find(list.begin(), list.end(), entry);
        if (it == list.end()) {
            throw HostCtlException(Lib::Quote(address) + " is not on the allowed list of ruleset " +
                                   Lib::Quote(id_));
        }
        list.erase(it);
        Apply();
    }

    bool IsValid() override {
        Enter("IsValid");
        state_ = LoadedState(host_);
        return state_.Find(id_) != nullptr;
    }

    void SetAllowedAll(bool allowedAll) override {
        Get("SetAllowedAll", Lib::Args(allowedAll)).allowedAll = allowedAll;
        Apply();
    }
    bool IsAllowedAll() override { return Get("IsAllowedAll").allowedAll; }

private:
    void Enter(const char* operation, const std::string& arguments = {}) const {
        Lib::Enter(std::string("HostCtl::System::FirewallRuleset::") + operation, id_, arguments);
    }

    // Starts an operation: the host's firewall now, and the ruleset in it.
    Backend::FirewallRulesetState& Get(const char* operation, const std::string& arguments = {}) {
        Enter(operation, arguments);
        state_ = LoadedState(host_);
        auto* ruleset = state_.Find(id_);
        if (!ruleset) throw HostCtlException("Ruleset " + Lib::Quote(id_) + " not found");
        return *ruleset;
    }
    void Apply() { host_.GetFirewall().Write(state_); }

    // An entry as the host keeps it: a network of one address is that address.
    static std::string HostText(const Model::AllowedIp& entry) {
        const auto& text = entry.text;
        auto slash = text.find('/');
        if (slash == std::string::npos) return text;
        const bool v4 = entry.kind == Model::AllowedIpKind::kIpv4Network;
        if (text.substr(slash + 1) == (v4 ? "32" : "128")) return text.substr(0, slash);
        return text;
    }

    Backend::Host& host_;
    std::string id_;
    Backend::FirewallState state_;
};

}  // namespace

SystemInfoImpl::SystemInfoImpl() = default;
SystemInfoImpl::~SystemInfoImpl() = default;

bool SystemInfoImpl::IsFirewallEnabled() {
    Lib::Enter("TknCtl::System::SystemInfoImpl::IsFirewallEnabled");
    if (auto* host = Lib::RealHost()) return LoadedState(*host).enabled;
    return Loaded().enabled;
}

void SystemInfoImpl::SetFirewallEnabled(bool enabled) {
    Lib::Enter("TknCtl::System::SystemInfoImpl::SetFirewallEnabled", {}, Lib::Args(enabled));
    if (auto* host = Lib::RealHost()) {
        auto state = LoadedState(*host);
        state.enabled = enabled;
        return host->GetFirewall().Write(state);
    }
    LoadedForWrite().enabled = enabled;
}

bool SystemInfoImpl::GetFirewallDefaultAction() {
    Lib::Enter("TknCtl::System::SystemInfoImpl::GetFirewallDefaultAction");
    if (auto* host = Lib::RealHost()) return LoadedState(*host).pass;
    return Loaded().defaultActionPass;
}

void SystemInfoImpl::SetFirewallDefaultAction(bool pass) {
    Lib::Enter("TknCtl::System::SystemInfoImpl::SetFirewallDefaultAction", {}, Lib::Args(pass));
    if (auto* host = Lib::RealHost()) {
        auto state = LoadedState(*host);
        state.pass = pass;
        return host->GetFirewall().Write(state);
    }
    LoadedForWrite().defaultActionPass = pass;
}

std::vector<std::unique_ptr<HostCtl::System::FirewallRuleset>> SystemInfoImpl::GetFirewallRulesets() {
    Lib::Enter("TknCtl::System::SystemInfoImpl::GetFirewallRulesets");
    std::vector<std::unique_ptr<HostCtl::System::FirewallRuleset>> out;
    if (auto* host = Lib::RealHost()) {
        for (const auto& ruleset : LoadedState(*host).rulesets)
            out.push_back(std::make_unique<RealFirewallRuleset>(*host, ruleset.name));
        return out;
    }
    for (const auto& ruleset : Loaded().rulesets)
        out.push_back(std::make_unique<FirewallRulesetImpl>(ruleset.id));
    return out;
}

std::unique_ptr<HostCtl::System::FirewallRuleset> SystemInfoImpl::GetFirewallRulesetById(
    const std::string& id) {
    Lib::Enter("TknCtl::System::SystemInfoImpl::GetFirewallRulesetById", id);
    if (auto* host = Lib::RealHost()) {
        LoadedState(*host);
        return std::make_unique<RealFirewallRuleset>(*host, id);
    }
    Loaded();
    return std::make_unique<FirewallRulesetImpl>(id);
}

void SystemInfoImpl::LoadFirewallRulesets() {
    Lib::Enter("TknCtl::System::SystemInfoImpl::LoadFirewallRulesets");
    if (auto* host = Lib::RealHost()) {
        auto state = LoadedState(*host);
        host->GetFirewall().Reconfigure(state);
        state.dynamicRules.clear();
        return host->GetFirewall().Write(state);
    }
    auto& section = LoadedForWrite();
    section.filtersInstalled = true;
    section.dynamicRules.clear();
}

void SystemInfoImpl::DestroyFirewallFilters() {
    Lib::Enter("TknCtl::System::SystemInfoImpl::DestroyFirewallFilters");
    if (auto* host = Lib::RealHost()) {
        // The filters are the firewall's table: they go with the module; the dynamic rules go now.
        auto state = LoadedState(*host);
        state.dynamicRules.clear();
        return host->GetFirewall().Write(state);
    }
    auto& section = LoadedForWrite();
    section.filtersInstalled = false;
    section.dynamicRules.clear();
}

std::vector<std::unique_ptr<HostCtl::System::FirewallRule>> SystemInfoImpl::GetFirewallDynamicRules() {
    Lib::Enter("TknCtl::System::SystemInfoImpl::GetFirewallDynamicRules");
    if (auto* host = Lib::RealHost()) return ToRules(LoadedState(*host).dynamicRules);
    return ToRules(Loaded().dynamicRules);
}

void SystemInfoImpl::AddFirewallDynamicRule(HostCtl::System::FirewallRule& rule) {
    const std::string text = RuleText(rule);
    Lib::Enter("TknCtl::System::SystemInfoImpl::AddFirewallDynamicRule", {}, text);
    if (auto* host = Lib::RealHost()) {
        auto state = LoadedState(*host);
        if (!WellFormed(rule)) throw HostCtlException("Invalid dynamic rule " + text);
        for (const auto& existing : state.dynamicRules) {
            if (existing == rule)
                throw HostCtlException("The dynamic rule " + text + " is already installed");
        }
        state.dynamicRules.push_back(rule);
        return host->GetFirewall().Write(state);
    }
    const auto& section = Loaded();
    if (!section.filtersInstalled)
        throw HostCtlException(
            "Cannot add the dynamic rule " + text +
            ": the firewall filters are not installed (load the ruleset configuration first)");
    if (!WellFormed(rule)) throw HostCtlException("Invalid dynamic rule " + text);
    Model::FirewallRule added{rule.GetPortType(), rule.GetPortBegin(), rule.GetPortEnd(), rule.GetDirection(),
                              rule.GetProtocol()};
    for (const auto& existing : section.dynamicRules) {
        if (SameRule(existing, added))
            throw HostCtlException("The dynamic rule " + text + " is already installed");
    }
    Lib::Write<FirewallSection>().dynamicRules.push_back(added);
}

}  // namespace TknCtl::System

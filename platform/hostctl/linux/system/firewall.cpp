// The firewall of the Linux host: nftables, in one table of its own (inet hadro; see
// kernel/nftables.h), in the namespace the program runs in. The module is loaded while the
// table exists; the firewall is enabled while its input chain filters, and the chain's policy
// is the default action; each enabled ruleset is a chain with its rules and its allowed
// addresses as sets.
//
// What the kernel has no notion of lives in the host's document ("firewall" member): the
// default action while the firewall is disabled, and each ruleset's switches, allowed list and
// clients, so that a ruleset keeps them while it is disabled and the firewall keeps them while
// it is unloaded:
//
//     "firewall": {"enabled": true, "defaultAction": "DROP",
//                  "rulesets": {"sshServer": {"enabled": true, "allowedAll": false,
//                                             "allowedIps": ["192.0.2.0/24"], "clients": 1}}}
//
// The rulesets, their rules and the state they start in come from the catalogue
// (system/firewall_catalogue.h).
#include <algorithm>
#include <limits>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>

#include "backend/firewall.h"
#include "core/context.h"
#include "hostctl/exception.h"
#include "hostctl/session.h"
#include "kernel/nftables.h"
#include "network/areas.h"
#include "system/firewall_catalogue.h"

namespace TknCtl::Linux {

namespace {

using Backend::FirewallRulesetState;
using Backend::FirewallState;
using HostCtl::Lib::HostCtlException;
using nlohmann::json;

constexpr const char* kMember = "firewall";

std::vector<HostCtl::System::FirewallRule> HostRules(const std::vector<Kernel::NftRule>& rules) {
    std::vector<HostCtl::System::FirewallRule> out;
    out.reserve(rules.size());
    for (const auto& r : rules)
        out.emplace_back(r.portType, r.portBegin, r.portEnd, r.direction, r.protocol);
    return out;
}

std::vector<Kernel::NftRule> KernelRules(const std::vector<HostCtl::System::FirewallRule>& rules) {
    std::vector<Kernel::NftRule> out;
    out.reserve(rules.size());
    for (const auto& r : rules)
        out.push_back({r.GetPortType(), r.GetPortBegin(), r.GetPortEnd(), r.GetDirection(), r.GetProtocol()});
    return out;
}

// What the document remembers of a ruleset.
struct Remembered {
    bool enabled = false;
    bool allowedAll = true;
    std::vector<std::string> allowedIps;
    std::int32_t clients = 0;
};

struct Memory {
    std::optional<bool> enabled;
    std::optional<bool> pass;
    std::map<std::string, Remembered> rulesets;
};

class LinuxFirewall final : public Backend::Firewall {
public:
    explicit LinuxFirewall(Context& context) : context_(context) {}

    FirewallState Read() override {
        // Asked before libnftables is loaded: it would tell the user itself, on stderr.
        if (!Context::HasNetAdmin()) throw HostCtlException(Kernel::kFirewallNeedsRoot);
        std::vector<std::string> unknown;
        auto kernel = Kernel::ReadFirewall(&unknown);
        for (const auto& what : unknown)
            context_.Warn("nftables table inet hadro: " + what + "; the firewall's next change drops it");
        const Memory memory = Recall();
        FirewallState state;
        state.loaded = kernel.has_value();
        // A new firewall filters, and drops what no ruleset admits.
        state.enabled = kernel ? kernel->enabled : memory.enabled.value_or(true);
        state.pass = kernel && kernel->enabled ? kernel->pass : memory.pass.value_or(false);
        auto inKernel = [&](const std::string& name) -> const Kernel::NftRuleset* {
            if (!kernel) return nullptr;
            for (const auto& r : kernel->rulesets) {
                if (r.name == name) return &r;
            }
            return nullptr;
        };
        for (const auto& configured : Catalogue().rulesets) {
            FirewallRulesetState ruleset;
            ruleset.name = configured.name;
            auto remembered = memory.rulesets.find(configured.name);
            const Remembered* known = remembered == memory.rulesets.end() ? nullptr : &remembered->second;
            ruleset.clients = known ? known->clients : 0;
            if (const auto* held = inKernel(configured.name)) {
                ruleset.enabled = true;
                ruleset.allowedAll = held->allowedAll;
                ruleset.allowedIps = held->allowed;
                ruleset.rules = HostRules(held->rules);
            } else {
                ruleset.enabled = !kernel && (known ? known->enabled : configured.enabled);
                ruleset.allowedAll = known ? known->allowedAll : configured.allowedAll;
                ruleset.allowedIps = known ? known->allowedIps : configured.allowedIps;
                ruleset.rules = HostRules(configured.rules);
            }
            state.rulesets.push_back(std::move(ruleset));
        }
        // A ruleset the configuration no longer has stays as long as the kernel applies it.
        if (kernel) {
            for (const auto& held : kernel->rulesets) {
                if (Catalogue().Find(held.name)) continue;
                if (!IsRulesetName(held.name)) {
                    context_.Warn("nftables table inet hadro: chain " + held.name +
                                  " is no ruleset of the firewall; the firewall's next change drops it");
                    continue;
                }
                auto remembered = memory.rulesets.find(held.name);
                state.rulesets.push_back(
                    {held.name, true, held.allowedAll, held.allowed, HostRules(held.rules),
                     remembered == memory.rulesets.end() ? 0 : remembered->second.clients});
            }
            state.dynamicRules = HostRules(kernel->dynamicRules);
        }
        return state;
    }

    void Write(const FirewallState& asked) override {
        context_.BeginChange();
        FirewallState state = asked;
        for (auto& ruleset : state.rulesets)
            Canonicalize(ruleset);
        auto current = Kernel::ReadFirewall();
        if (state.loaded) {
            Kernel::NftFirewall wanted = ToKernel(state);
            if (!current || !Kernel::Difference(wanted, *current).empty()) {
                Kernel::WriteFirewall(wanted);
                // (A dry run wrote nothing to read back: the kernel checked the table.)
                auto held = Kernel::DryRun() ? std::optional(wanted) : Kernel::ReadFirewall();
                std::string difference = held ? Kernel::Difference(wanted, *held) : "it is not there";
                if (!difference.empty()) {
                    Restore(current);
                    throw HostCtlException(
                        "The firewall's nftables table inet hadro does not hold what was asked (" +
                        difference + "); it was put back as it was");
                }
            }
        } else if (current) {
            Kernel::DeleteFirewall();
            if (!Kernel::DryRun() && Kernel::ReadFirewall())
                throw HostCtlException(
                    "The firewall's nftables table inet hadro is still there after it was deleted");
        }
        Remember(state);
    }

    void Reconfigure(FirewallState& state) override {
        catalogue_ = Checked(FirewallCatalogue::Load());
        // A ruleset the host has not applied before starts as the configuration says.
        const Memory memory = Recall();
        std::vector<FirewallRulesetState> rulesets;
        for (const auto& configured : catalogue_->rulesets) {
            FirewallRulesetState ruleset;
            const auto* existing = state.Find(configured.name);
            if (existing && (existing->enabled || memory.rulesets.count(configured.name))) {
                ruleset = *existing;
            } else {
                ruleset.name = configured.name;
                ruleset.enabled = configured.enabled;
                ruleset.allowedAll = configured.allowedAll;
                ruleset.allowedIps = configured.allowedIps;
            }
            ruleset.rules = HostRules(configured.rules);
            rulesets.push_back(std::move(ruleset));
        }
        state.rulesets = std::move(rulesets);
    }

private:
    // The table as it was before a change that did not come out as asked; as far as it goes.
    static void Restore(const std::optional<Kernel::NftFirewall>& before) {
        try {
            if (before) {
                Kernel::WriteFirewall(*before);
            } else {
                Kernel::DeleteFirewall();
            }
        } catch (const HostCtlException&) {
            // The failure reported is the change's.
        }
    }

    const FirewallCatalogue& Catalogue() {
        if (!catalogue_) catalogue_ = Checked(FirewallCatalogue::Load());
        return *catalogue_;
    }

    // The names of the files' rulesets are the names of chains: nft's own parser must take them.
    static FirewallCatalogue Checked(FirewallCatalogue catalogue) {
        for (const auto& ruleset : catalogue.rulesets) {
            if (ruleset.origin.empty() || Kernel::IsNftName(ruleset.name)) continue;
            throw HostCtl::Lib::StateFileError("firewall rulesets " + ruleset.origin + ": line " +
                                               std::to_string(ruleset.line) + ": ruleset '" + ruleset.name +
                                               "': the name is a word of nft's language; choose another");
        }
        return catalogue;
    }

    // The allowed list as the kernel's sets keep it: canonical text, no entry overlapping
    // another (an interval set cannot hold both).
    static void Canonicalize(FirewallRulesetState& ruleset) {
        std::vector<std::string> entries;
        for (const auto& text : ruleset.allowedIps) {
            auto entry = Kernel::CanonicalAllowed(text);
            if (!entry)
                throw HostCtlException("Invalid allowed address " + text + " for ruleset '" + ruleset.name +
                                       "'");
            for (const auto& other : entries) {
                if (Kernel::Overlaps(other, *entry)) {
                    throw HostCtlException(
                        "Cannot have " + text + " on the allowed list of ruleset '" + ruleset.name +
                        "' with " + other +
                        ": they overlap, and the kernel's address sets (nftables interval sets) "
                        "cannot hold overlapping entries");
                }
            }
            entries.push_back(*entry);
        }
        ruleset.allowedIps = std::move(entries);
    }

    Kernel::NftFirewall ToKernel(const FirewallState& state) {
        Kernel::NftFirewall firewall;
        firewall.enabled = state.enabled;
        firewall.pass = state.pass;
        for (const auto& ruleset : state.rulesets) {
            if (!IsRulesetName(ruleset.name))
                throw HostCtlException("Ruleset '" + ruleset.name + "' not found");
            if (!ruleset.enabled) continue;
            firewall.rulesets.push_back(
                {ruleset.name, KernelRules(ruleset.rules), ruleset.allowedAll, ruleset.allowedIps});
        }
        firewall.dynamicRules = KernelRules(state.dynamicRules);
        return firewall;
    }

    // ------------------------------------------------------------ the document

    Memory Recall() {
        Memory memory;
        const json& member = context_.GetDocument().Read(kMember);
        if (member.is_null()) return memory;
        auto& document = context_.GetDocument();
        if (!member.is_object()) document.Refuse(kMember, "not an object");
        auto flag = [&](const json& object, const char* key,
                        const std::string& where) -> std::optional<bool> {
            auto it = object.find(key);
            if (it == object.end()) return std::nullopt;
            if (!it->is_boolean()) document.Refuse(kMember, where + "\"" + key + "\" is not true or false");
            return it->get<bool>();
        };
        memory.enabled = flag(member, "enabled", "");
        if (auto it = member.find("defaultAction"); it != member.end()) {
            if (*it != "PASS" && *it != "DROP")
                document.Refuse(kMember, "\"defaultAction\" is not PASS or DROP");
            memory.pass = *it == "PASS";
        }
        auto rulesets = member.find("rulesets");
        if (rulesets == member.end()) return memory;
        if (!rulesets->is_object()) document.Refuse(kMember, "\"rulesets\" is not an object");
        for (const auto& [name, value] : rulesets->items()) {
            const std::string where = "ruleset " + name + ": ";
            if (!value.is_object()) document.Refuse(kMember, where + "not an object");
            Remembered remembered;
            remembered.enabled = flag(value, "enabled", where).value_or(false);
            remembered.allowedAll = flag(value, "allowedAll", where).value_or(true);
            if (auto it = value.find("allowedIps"); it != value.end()) {
                if (!it->is_array()) document.Refuse(kMember, where + "\"allowedIps\" is not a list");
                for (const auto& entry : *it) {
                    auto text =
                        entry.is_string() ? Kernel::CanonicalAllowed(entry.get<std::string>()) : std::nullopt;
                    if (!text) document.Refuse(kMember, where + "an allowed entry is no address or network");
                    remembered.allowedIps.push_back(*text);
                }
            }
            if (auto it = value.find("clients"); it != value.end()) {
                if (!it->is_number_integer() || it->get<std::int64_t>() < 0 ||
                    it->get<std::int64_t>() > std::numeric_limits<std::int32_t>::max())
                    document.Refuse(kMember, where + "\"clients\" is not a count");
                remembered.clients = it->get<std::int32_t>();
            }
            memory.rulesets.emplace(name, std::move(remembered));
        }
        return memory;
    }

    void Remember(const FirewallState& state) {
        json rulesets = json::object();
        for (const auto& ruleset : state.rulesets) {
            rulesets[ruleset.name] = {{"enabled", ruleset.enabled},
                                      {"allowedAll", ruleset.allowedAll},
                                      {"allowedIps", ruleset.allowedIps},
                                      {"clients", ruleset.clients}};
        }
        json member{{"enabled", state.enabled},
                    {"defaultAction", state.pass ? "PASS" : "DROP"},
                    {"rulesets", std::move(rulesets)}};
        if (context_.GetDocument().Read(kMember) != member)
            context_.GetDocument().Write(kMember) = std::move(member);
    }

    Context& context_;
    std::optional<FirewallCatalogue> catalogue_;
};

}  // namespace

std::unique_ptr<Backend::Firewall> MakeFirewall(Context& context) {
    return std::make_unique<LinuxFirewall>(context);
}

}  // namespace TknCtl::Linux

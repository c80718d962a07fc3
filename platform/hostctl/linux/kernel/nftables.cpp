#include "kernel/nftables.h"

#include <arpa/inet.h>
#include <dlfcn.h>

#include <algorithm>
#include <cstring>
#include <map>
#include <nlohmann/json.hpp>
#include <set>

#include "hostctl/exception.h"
#include "kernel/describe.h"
#include "kernel/dryrun.h"

// The library's header defines _GNU_SOURCE itself; the compiler already has.
#undef _GNU_SOURCE
#include <nftables/libnftables.h>

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;
using nlohmann::json;

// ---------------------------------------------------------------- allowed entries

namespace {

// An address or network as bytes: 4 or 16 of them, and a prefix length.
struct Entry {
    int family = AF_INET;
    unsigned char bytes[16] = {};
    unsigned prefix = 0;
    unsigned Bits() const { return family == AF_INET ? 32 : 128; }
    unsigned Length() const { return family == AF_INET ? 4 : 16; }
};

std::optional<Entry> ParseEntry(const std::string& text) {
    Entry entry;
    std::string address = text;
    std::optional<unsigned> prefix;
    if (auto slash = text.find('/'); slash != std::string::npos) {
        std::string digits = text.substr(slash + 1);
        if (digits.empty() || digits.size() > 3 ||
            !std::all_of(digits.begin(), digits.end(), [](char c) { return c >= '0' && c <= '9'; }))
            return std::nullopt;
        prefix = static_cast<unsigned>(std::stoul(digits));
        address = text.substr(0, slash);
    }
    if (inet_pton(AF_INET, address.c_str(), entry.bytes) == 1) {
        entry.family = AF_INET;
    } else if (inet_pton(AF_INET6, address.c_str(), entry.bytes) == 1) {
        entry.family = AF_INET6;
    } else {
        return std::nullopt;
    }
    entry.prefix = prefix.value_or(entry.Bits());
    if (entry.prefix > entry.Bits()) return std::nullopt;
    for (unsigned bit = entry.prefix; bit < entry.Bits(); ++bit)
        entry.bytes[bit / 8] &= static_cast<unsigned char>(~(0x80u >> (bit % 8)));
    return entry;
}

std::string AddressText(const Entry& entry) {
    char text[INET6_ADDRSTRLEN] = {};
    inet_ntop(entry.family, entry.bytes, text, sizeof(text));
    return text;
}

std::string EntryText(const Entry& entry) {
    std::string text = AddressText(entry);
    return entry.prefix == entry.Bits() ? text : text + "/" + std::to_string(entry.prefix);
}

using Wide = unsigned __int128;

Wide ToWide(const Entry& entry) {
    Wide value = 0;
    for (unsigned i = 0; i < entry.Length(); ++i)
        value = (value << 8) | entry.bytes[i];
    return value;
}

Entry FromWide(int family, Wide value, unsigned prefix) {
    Entry entry;
    entry.family = family;
    entry.prefix = prefix;
    for (unsigned i = entry.Length(); i-- > 0;) {
        entry.bytes[i] = static_cast<unsigned char>(value & 0xff);
        value >>= 8;
    }
    return entry;
}

// A range of addresses ("first-last") as the fewest networks that cover it exactly.
std::vector<std::string> RangeToNetworks(const std::string& first, const std::string& last) {
    auto low = ParseEntry(first);
    auto high = ParseEntry(last);
    std::vector<std::string> out;
    if (!low || !high || low->family != high->family) return out;
    const unsigned bits = low->Bits();
    Wide from = ToWide(*low);
    const Wide to = ToWide(*high);
    if (from > to) return out;
    // The last address of the block of 2^size addresses that starts at from.
    auto blockEnd = [&](unsigned size) { return size >= 128 ? ~Wide(0) : from + ((Wide(1) << size) - 1); };
    while (true) {
        // The largest aligned block that starts at from and ends within the range.
        unsigned size = 0;
        while (size < bits) {
            const unsigned next = size + 1;
            const Wide mask = next >= 128 ? ~Wide(0) : (Wide(1) << next) - 1;
            if ((from & mask) != 0 || blockEnd(next) > to) break;
            size = next;
        }
        out.push_back(EntryText(FromWide(low->family, from, bits - size)));
        const Wide last = blockEnd(size);
        if (last >= to) break;
        from = last + 1;
    }
    return out;
}

}  // namespace

std::optional<std::string> CanonicalAllowed(const std::string& text) {
    auto entry = ParseEntry(text);
    if (!entry) return std::nullopt;
    return EntryText(*entry);
}

bool Overlaps(const std::string& a, const std::string& b) {
    auto x = ParseEntry(a);
    auto y = ParseEntry(b);
    if (!x || !y || x->family != y->family) return false;
    const unsigned prefix = std::min(x->prefix, y->prefix);
    for (unsigned bit = 0; bit < prefix; ++bit) {
        const unsigned char mask = static_cast<unsigned char>(0x80u >> (bit % 8));
        if ((x->bytes[bit / 8] & mask) != (y->bytes[bit / 8] & mask)) return false;
    }
    return true;
}

// ---------------------------------------------------------------- the table as commands

namespace {

const char* Direction(std::uint32_t direction) {
    return direction == 0 ? "inbound" : "outbound";
}

// Inbound traffic is matched by the port as given; outbound traffic by its replies, whose
// source port is the destination port of the traffic (and the other way round).
bool MatchesDestinationPort(const NftRule& rule) {
    return (rule.direction == 0) == (rule.portType == 1);
}

json Object(const char* kind, json body) {
    body["family"] = kFirewallFamily;
    if (std::strcmp(kind, "table") == 0) {
        body["name"] = kFirewallTable;
    } else {
        body["table"] = kFirewallTable;
    }
    return json{{kind, std::move(body)}};
}

json Add(const char* kind, json body) {
    return json{{"add", Object(kind, std::move(body))}};
}

json Match(json left, json right) {
    return json{{"match", {{"op", "=="}, {"left", std::move(left)}, {"right", std::move(right)}}}};
}

json Payload(const char* protocol, const char* field) {
    return json{{"payload", {{"protocol", protocol}, {"field", field}}}};
}

json Rule(const std::string& chain, json expressions, const char* comment = nullptr) {
    json body{{"chain", chain}, {"expr", std::move(expressions)}};
    if (comment) body["comment"] = comment;
    return Add("rule", std::move(body));
}

json PortRule(const std::string& chain, const NftRule& rule, const char* setFamily, const std::string& set) {
    json expressions = json::array();
    if (setFamily) expressions.push_back(Match(Payload(setFamily, "saddr"), "@" + set));
    json ports = rule.portBegin == rule.portEnd ? json(rule.portBegin)
                                                : json{{"range", {rule.portBegin, rule.portEnd}}};
    expressions.push_back(
        Match(Payload(rule.protocol == 0 ? "tcp" : "udp", MatchesDestinationPort(rule) ? "dport" : "sport"),
              std::move(ports)));
    expressions.push_back(json{{"accept", nullptr}});
    return Rule(chain, std::move(expressions), Direction(rule.direction));
}

json SetElement(const std::string& text) {
    auto slash = text.find('/');
    if (slash == std::string::npos) return text;
    return json{{"prefix", {{"addr", text.substr(0, slash)}, {"len", std::stoi(text.substr(slash + 1))}}}};
}

std::string SetName(const std::string& ruleset, bool ipv6) {
    return ruleset + (ipv6 ? "_v6" : "_v4");
}

}  // namespace

std::string BuildFirewall(const NftFirewall& firewall) {
    json commands = json::array();
    // Created first so that the delete always finds it: the whole table is replaced.
    commands.push_back(Add("table", json::object()));
    commands.push_back(json{{"delete", Object("table", json::object())}});
    commands.push_back(Add("table", json::object()));
    const char* policy = firewall.enabled && !firewall.pass ? "drop" : "accept";
    commands.push_back(
        Add("chain",
            {{"name", kInputChain}, {"type", "filter"}, {"hook", "input"}, {"prio", 0}, {"policy", policy}}));
    commands.push_back(Add("chain", {{"name", kRuntimeChain}}));
    for (const auto& ruleset : firewall.rulesets) {
        for (bool ipv6 : {false, true}) {
            json set{{"name", SetName(ruleset.name, ipv6)},
                     {"type", ipv6 ? "ipv6_addr" : "ipv4_addr"},
                     {"flags", {"interval"}}};
            json elements = json::array();
            for (const auto& entry : ruleset.allowed) {
                if ((entry.find(':') != std::string::npos) == ipv6) elements.push_back(SetElement(entry));
            }
            if (!elements.empty()) set["elem"] = std::move(elements);
            commands.push_back(Add("set", std::move(set)));
        }
        commands.push_back(Add("chain", {{"name", ruleset.name}}));
        for (const auto& rule : ruleset.rules) {
            if (ruleset.allowedAll) {
                commands.push_back(PortRule(ruleset.name, rule, nullptr, {}));
            } else {
                commands.push_back(PortRule(ruleset.name, rule, "ip", SetName(ruleset.name, false)));
                commands.push_back(PortRule(ruleset.name, rule, "ip6", SetName(ruleset.name, true)));
            }
        }
    }
    for (const auto& rule : firewall.dynamicRules)
        commands.push_back(PortRule(kRuntimeChain, rule, nullptr, {}));
    if (firewall.enabled) {
        // (Lists of expressions are made with json::array: a braced list of one value would be
        // taken for that value by some compilers.)
        const json accept = {{"accept", nullptr}};
        commands.push_back(
            Rule(kInputChain, json::array({Match(json{{"meta", {{"key", "iifname"}}}}, "lo"), accept})));
        json established = {{"match",
                             {{"op", "in"},
                              {"left", {{"ct", {{"key", "state"}}}}},
                              {"right", json::array({"established", "related"})}}}};
        commands.push_back(Rule(kInputChain, json::array({established, accept})));
        commands.push_back(Rule(
            kInputChain, json::array({Match(json{{"meta", {{"key", "l4proto"}}}}, "ipv6-icmp"), accept})));
        for (const auto& ruleset : firewall.rulesets) {
            json jump = {{"jump", {{"target", ruleset.name}}}};
            commands.push_back(Rule(kInputChain, json::array({jump})));
        }
        json runtime = {{"jump", {{"target", kRuntimeChain}}}};
        commands.push_back(Rule(kInputChain, json::array({runtime})));
    }
    return json{{"nftables", std::move(commands)}}.dump();
}

std::string BuildFirewallDelete() {
    json remove = {{"delete", Object("table", json::object())}};
    return json{{"nftables", json::array({remove})}}.dump();
}

// ---------------------------------------------------------------- the table as read

namespace {

struct ReadRule {
    NftRule rule;
    int setFamily = 0;  // 0 none, 4 or 6: the rule matches the allowed set of that family
};

std::optional<std::uint32_t> Port(const json& value) {
    if (value.is_number_unsigned() && value.get<std::uint64_t>() <= 65535) return value.get<std::uint32_t>();
    return std::nullopt;
}

// A rule the firewall makes; nothing for any other.
std::optional<ReadRule> ParseRule(const json& rule, const std::string& chain) {
    ReadRule out;
    auto comment = rule.find("comment");
    if (comment == rule.end() || !comment->is_string()) return std::nullopt;
    if (*comment == "inbound") {
        out.rule.direction = 0;
    } else if (*comment == "outbound") {
        out.rule.direction = 1;
    } else {
        return std::nullopt;
    }
    auto expressions = rule.find("expr");
    if (expressions == rule.end() || !expressions->is_array()) return std::nullopt;
    bool port = false;
    bool accept = false;
    bool destination = false;
    for (const auto& e : *expressions) {
        if (accept) return std::nullopt;  // nothing after the verdict
        if (e.contains("accept")) {
            accept = true;
            continue;
        }
        auto match = e.find("match");
        if (match == e.end() || match->value("op", "") != "==") return std::nullopt;
        const json& left = match->value("left", json());
        const json& right = match->value("right", json());
        if (!left.contains("payload")) return std::nullopt;
        const std::string protocol = left["payload"].value("protocol", "");
        const std::string field = left["payload"].value("field", "");
        if ((protocol == "ip" || protocol == "ip6") && field == "saddr" && right.is_string()) {
            if (out.setFamily || right.get<std::string>() != "@" + SetName(chain, protocol == "ip6"))
                return std::nullopt;
            out.setFamily = protocol == "ip6" ? 6 : 4;
        } else if ((protocol == "tcp" || protocol == "udp") && (field == "dport" || field == "sport") &&
                   !port) {
            port = true;
            out.rule.protocol = protocol == "tcp" ? 0 : 1;
            destination = field == "dport";
            if (auto single = Port(right)) {
                out.rule.portBegin = out.rule.portEnd = *single;
            } else if (right.is_object() && right.contains("range") && right["range"].is_array() &&
                       right["range"].size() == 2) {
                auto first = Port(right["range"][0]);
                auto last = Port(right["range"][1]);
                if (!first || !last) return std::nullopt;
                out.rule.portBegin = *first;
                out.rule.portEnd = *last;
            } else {
                return std::nullopt;
            }
        } else {
            return std::nullopt;
        }
    }
    if (!port || !accept) return std::nullopt;
    // The reverse of MatchesDestinationPort.
    out.rule.portType = (out.rule.direction == 0) == destination ? 1 : 0;
    return out;
}

std::vector<std::string> SetEntries(const json& set) {
    std::vector<std::string> out;
    auto elements = set.find("elem");
    if (elements == set.end() || !elements->is_array()) return out;
    for (const auto& element : *elements) {
        if (element.is_string()) {
            if (auto text = CanonicalAllowed(element.get<std::string>())) out.push_back(*text);
        } else if (element.contains("prefix")) {
            const json& prefix = element["prefix"];
            if (prefix.contains("addr") && prefix["addr"].is_string() && prefix.contains("len")) {
                if (auto text =
                        CanonicalAllowed(prefix["addr"].get<std::string>() + "/" + prefix["len"].dump()))
                    out.push_back(*text);
            }
        } else if (element.contains("range") && element["range"].is_array() && element["range"].size() == 2 &&
                   element["range"][0].is_string() && element["range"][1].is_string()) {
            for (auto& network : RangeToNetworks(element["range"][0], element["range"][1]))
                out.push_back(std::move(network));
        }
    }
    return out;
}

}  // namespace

NftFirewall ParseFirewall(const std::string& listing, std::vector<std::string>* unknown) {
    json parsed = json::parse(listing, nullptr, false);
    if (parsed.is_discarded() || !parsed.is_object() || !parsed.contains("nftables") ||
        !parsed["nftables"].is_array())
        throw HostCtlException("libnftables listed the table inet hadro in a form it does not read");
    auto note = [&](std::string text) {
        if (unknown) unknown->push_back(std::move(text));
    };

    std::vector<std::string> chains;
    std::map<std::string, std::vector<const json*>> rules;
    std::map<std::string, const json*> sets;
    const json* input = nullptr;
    for (const auto& item : parsed["nftables"]) {
        if (item.contains("chain")) {
            const json& chain = item["chain"];
            std::string name = chain.value("name", "");
            if (name == kInputChain) {
                input = &chain;
            } else if (chain.contains("hook")) {
                note("chain " + name + " is hooked into the data path but was not made by the firewall");
            } else if (name != kRuntimeChain) {
                chains.push_back(name);
            }
        } else if (item.contains("rule")) {
            rules[item["rule"].value("chain", "")].push_back(&item["rule"]);
        } else if (item.contains("set")) {
            sets[item["set"].value("name", "")] = &item["set"];
        }
    }

    NftFirewall firewall;
    if (input) {
        firewall.enabled = !rules[kInputChain].empty();
        firewall.pass = input->value("policy", "accept") != "drop";
    } else {
        note("the table has no input chain");
    }
    auto read = [&](const std::string& chain) {
        std::vector<ReadRule> out;
        for (const json* rule : rules[chain]) {
            if (auto parsed = ParseRule(*rule, chain)) {
                out.push_back(*parsed);
            } else {
                note("chain " + chain + " holds a rule the firewall did not make (handle " +
                     rule->value("handle", json(0)).dump() + ")");
            }
        }
        return out;
    };
    for (const auto& r : read(kRuntimeChain))
        firewall.dynamicRules.push_back(r.rule);
    for (const auto& name : chains) {
        NftRuleset ruleset;
        ruleset.name = name;
        auto read_rules = read(name);
        ruleset.allowedAll = std::none_of(read_rules.begin(), read_rules.end(),
                                          [](const ReadRule& r) { return r.setFamily != 0; });
        for (std::size_t i = 0; i < read_rules.size(); ++i) {
            // A rule of an allowed list is written once for each family's set.
            if (i > 0 && read_rules[i].setFamily == 6 && read_rules[i - 1].setFamily == 4 &&
                read_rules[i].rule == read_rules[i - 1].rule)
                continue;
            ruleset.rules.push_back(read_rules[i].rule);
        }
        for (bool ipv6 : {false, true}) {
            if (auto set = sets.find(SetName(name, ipv6)); set != sets.end()) {
                for (auto& entry : SetEntries(*set->second))
                    ruleset.allowed.push_back(std::move(entry));
            }
        }
        firewall.rulesets.push_back(std::move(ruleset));
    }
    return firewall;
}

std::string Difference(const NftFirewall& asked, const NftFirewall& held) {
    if (asked.enabled != held.enabled)
        return asked.enabled ? "the input chain does not filter" : "the input chain filters";
    if (asked.enabled && asked.pass != held.pass)
        return "the input chain's policy is not " + std::string(asked.pass ? "accept" : "drop");
    if (asked.dynamicRules != held.dynamicRules) return "the dynamic rules differ";
    if (asked.rulesets.size() != held.rulesets.size()) return "the enabled rulesets differ";
    for (std::size_t i = 0; i < asked.rulesets.size(); ++i) {
        const auto& a = asked.rulesets[i];
        const auto& h = held.rulesets[i];
        if (a.name != h.name) return "the enabled rulesets differ";
        if (a.rules != h.rules) return "the rules of ruleset " + a.name + " differ";
        if (a.allowedAll != h.allowedAll && !a.rules.empty())
            return "ruleset " + a.name +
                   (a.allowedAll ? " matches addresses though all are allowed"
                                 : " does not match its allowed addresses");
        std::multiset<std::string> x(a.allowed.begin(), a.allowed.end());
        std::multiset<std::string> y(h.allowed.begin(), h.allowed.end());
        if (x != y) return "the allowed addresses of ruleset " + a.name + " differ";
    }
    return {};
}

// ---------------------------------------------------------------- libnftables

struct Nftables::Library {
    void* handle = nullptr;
    decltype(&nft_ctx_new) ctxNew = nullptr;
    decltype(&nft_ctx_free) ctxFree = nullptr;
    decltype(&nft_run_cmd_from_buffer) run = nullptr;
    decltype(&nft_ctx_output_set_flags) setOutputFlags = nullptr;
    decltype(&nft_ctx_buffer_output) bufferOutput = nullptr;
    decltype(&nft_ctx_buffer_error) bufferError = nullptr;
    decltype(&nft_ctx_get_output_buffer) outputBuffer = nullptr;
    decltype(&nft_ctx_get_error_buffer) errorBuffer = nullptr;
    decltype(&nft_ctx_set_dry_run) setDryRun = nullptr;
    nft_ctx* ctx = nullptr;
};

namespace {

const char* const kUnavailable = "The firewall is not available on this Linux host: ";

template <class Function>
void Resolve(void* handle, const std::string& library, const char* name, Function& function) {
    function = reinterpret_cast<Function>(dlsym(handle, name));
    if (!function) throw HostCtlException(std::string(kUnavailable) + library + " has no " + name);
}

// The first line of libnftables' error text that says something, without its prefixes.
std::string Reason(const std::string& error) {
    std::size_t start = 0;
    while (start < error.size()) {
        std::size_t end = error.find('\n', start);
        if (end == std::string::npos) end = error.size();
        std::string line = error.substr(start, end - start);
        start = end + 1;
        if (auto at = line.find("Error: "); at != std::string::npos) line = line.substr(at + 7);
        if (!line.empty()) return line;
    }
    return "no reason given";
}

}  // namespace

Nftables::Nftables(const std::string& library) : library_(std::make_unique<Library>()) {
    auto& lib = *library_;
    lib.handle = dlopen(library.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (!lib.handle) {
        const char* why = dlerror();
        throw HostCtlException(std::string(kUnavailable) + "cannot load " + library + " (" +
                               (why ? why : "unknown error") +
                               "); it comes with the nftables library (Debian: package libnftables1)");
    }
    Resolve(lib.handle, library, "nft_ctx_new", lib.ctxNew);
    Resolve(lib.handle, library, "nft_ctx_free", lib.ctxFree);
    Resolve(lib.handle, library, "nft_run_cmd_from_buffer", lib.run);
    Resolve(lib.handle, library, "nft_ctx_output_set_flags", lib.setOutputFlags);
    Resolve(lib.handle, library, "nft_ctx_buffer_output", lib.bufferOutput);
    Resolve(lib.handle, library, "nft_ctx_buffer_error", lib.bufferError);
    Resolve(lib.handle, library, "nft_ctx_get_output_buffer", lib.outputBuffer);
    Resolve(lib.handle, library, "nft_ctx_get_error_buffer", lib.errorBuffer);
    Resolve(lib.handle, library, "nft_ctx_set_dry_run", lib.setDryRun);
    lib.ctx = lib.ctxNew(NFT_CTX_DEFAULT);
    if (!lib.ctx) throw HostCtlException(std::string(kUnavailable) + "libnftables cannot make a context");
    // JSON out, and so JSON in as well.
    lib.setOutputFlags(lib.ctx, NFT_CTX_OUTPUT_JSON);
    if (lib.bufferOutput(lib.ctx) != 0 || lib.bufferError(lib.ctx) != 0)
        throw HostCtlException(std::string(kUnavailable) + "libnftables cannot buffer its output");
}

Nftables::~Nftables() {
    // The library stays loaded: it keeps state of its own for the life of the process.
    if (library_->ctx) library_->ctxFree(library_->ctx);
}

Nftables& Nftables::Get() {
    static std::unique_ptr<Nftables> instance;
    if (!instance) instance = std::make_unique<Nftables>("libnftables.so.1");
    return *instance;
}

Nftables::Result Nftables::Run(const std::string& commands) {
    auto& lib = *library_;
    Result result;
    result.ok = lib.run(lib.ctx, commands.c_str()) == 0;
    if (const char* out = lib.outputBuffer(lib.ctx)) result.output = out;
    if (const char* err = lib.errorBuffer(lib.ctx)) result.error = err;
    return result;
}

Nftables::Result Nftables::Check(const std::string& commands) {
    auto& lib = *library_;
    lib.setDryRun(lib.ctx, true);
    struct Back {
        Library& lib;
        ~Back() { lib.setDryRun(lib.ctx, false); }
    } back{lib};
    return Run(commands);
}

// ---------------------------------------------------------------- the kernel

namespace {

[[noreturn]] void Refuse(const std::string& what, const std::string& error) {
    std::string reason = Reason(error);
    if (reason.find("Operation not permitted") != std::string::npos)
        throw HostCtlException(kFirewallNeedsRoot);
    if (reason.find("Protocol not supported") != std::string::npos)
        throw HostCtlException(
            what + ": the kernel of this Linux host has no nftables (nf_tables, CONFIG_NF_TABLES)");
    throw HostCtlException(what + ": " + reason);
}

}  // namespace

std::optional<NftFirewall> ReadFirewall(std::vector<std::string>* unknown) {
    if (DryRun() && PlannedFirewall()) return *PlannedFirewall();
    auto result = Nftables::Get().Run(std::string("list table ") + kFirewallFamily + " " + kFirewallTable);
    if (!result.ok) {
        if (result.error.find("No such file or directory") != std::string::npos) return std::nullopt;
        Refuse("Cannot read the firewall's nftables table inet hadro", result.error);
    }
    return ParseFirewall(result.output, unknown);
}

bool IsNftName(const std::string& name) {
    // Asked of nft's own parser: a chain that is not there is fine, a syntax error is not.
    auto result =
        Nftables::Get().Run(std::string("list chain ") + kFirewallFamily + " " + kFirewallTable + " " + name);
    return result.ok || result.error.find("syntax error") == std::string::npos;
}

void WriteFirewall(const NftFirewall& firewall) {
    // A dry run has the kernel check the table, so that it refuses what it would refuse.
    auto result = DryRun() ? Nftables::Get().Check(BuildFirewall(firewall))
                           : Nftables::Get().Run(BuildFirewall(firewall));
    if (result.ok && DryRun()) {
        Record(DescribeFirewall(firewall), Namespace::Own());
        return PlanFirewall(firewall);
    }
    if (!result.ok) Refuse("The kernel refused the firewall's nftables table inet hadro", result.error);
}

void DeleteFirewall() {
    if (DryRun()) {
        Record(DescribeFirewallDelete(), Namespace::Own());
        return PlanFirewall(std::nullopt);
    }
    auto result = Nftables::Get().Run(BuildFirewallDelete());
    if (!result.ok && result.error.find("No such file or directory") == std::string::npos)
        Refuse("The kernel refused to delete the firewall's nftables table inet hadro", result.error);
}

}  // namespace TknCtl::Linux::Kernel

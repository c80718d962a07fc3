// IPsec of the Linux host: the kernel's xfrm states (security associations) and policies in
// the namespace the program runs in. The kernel has no names for them: the host's document
// keeps them ("ipsec" member), an association's keyed by its SPI, source and destination, a
// policy's by its selector and direction. Keys go to the kernel and stay there.
//
//     "ipsec": {"sas": [{"name": "sa1", "spi": 4096, "source": "2001:db8::1", "destination": "2001:db8::2"}],
//               "sps": [{"name": "sp1", "source": "2001:db8::/64", "destination": "::/0", "sourcePort": 0,
//                        "destinationPort": 22, "protocol": "tcp", "direction": "in"}]}
//
// What the kernel holds that the commands cannot express (IPv4, AH, forward policies, other
// algorithms) is left out of the listings with a warning; an association the document does not
// name was made by key exchange and is automatic ("auto"); a policy it does not name is shown
// as "xfrm-INDEX", the kernel's index.
#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <limits>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>
#include <tuple>

#include "backend/ipsec.h"
#include "core/context.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "kernel/xfrm.h"
#include "network/areas.h"

namespace TknCtl::Linux {

namespace {

using HostCtl::Lib::HostCtlException;
using Impl = TknCtl::Network::IpSecConfigImpl;
using nlohmann::json;
namespace Net = HostCtl::Network;

constexpr const char* kMember = "ipsec";
constexpr const char* kAuto = "auto";
constexpr const char* kUnnamedPrefix = "xfrm-";

struct Protocol {
    Net::IpSecULProtoType type;
    int number;
    const char* name;
};
constexpr Protocol kProtocols[] = {{Net::IPSEC_PROTO_ANY, 0, "any"},
                                   {Net::IPSEC_PROTO_TCP, 6, "tcp"},
                                   {Net::IPSEC_PROTO_UDP, 17, "udp"},
                                   {Net::IPSEC_PROTO_ICMP6, 58, "icmp6"}};

std::string Count(std::size_t n, const char* one, const char* many) {
    return std::to_string(n) + " " + (n == 1 ? one : many);
}

std::string Hex(std::uint32_t value) {
    char text[16];
    std::snprintf(text, sizeof text, "0x%x", value);
    return text;
}

std::string Canonical(const std::string& address) {
    return Net::Ipv6Address(address).GetStringAddress();
}

// The names the document keeps.
struct SaName {
    std::string name;
    std::uint32_t spi = 0;
    std::string source, destination;
    bool Matches(const Kernel::XfrmState& state) const {
        return spi == state.spi && source == state.source && destination == state.destination;
    }
};

struct SpName {
    std::string name;
    Kernel::XfrmSelector selector;
    int direction = Kernel::kXfrmOut;
    bool Matches(const Kernel::XfrmPolicy& policy) const {
        return direction == policy.direction && selector == policy.selector;
    }
};

// What a checkpoint does not hold: a removed association cannot be made again.
constexpr const char* kSaKeys = "the keys of IPsec security associations (the kernel never gives them back)";

// A state the commands can show: IPv6 ESP in transport or tunnel mode with named algorithms.
bool IsAssociation(const Kernel::XfrmState& state) {
    return state.family == Kernel::kXfrmInet6 && state.protocol == Kernel::kXfrmEsp &&
           (state.mode == Kernel::kXfrmTransport || state.mode == Kernel::kXfrmTunnel) && state.encryption &&
           !Kernel::EncryptionName(*state.encryption).empty() && state.integrity &&
           !Kernel::IntegrityName(*state.integrity).empty();
}

const Protocol* ProtocolByNumber(int number) {
    for (const auto& p : kProtocols) {
        if (p.number == number) return &p;
    }
    return nullptr;
}

// A policy the commands can show: a main IPv6 policy, in or out, of a protocol they name,
// that discards, passes or asks for one ESP state.
bool IsPolicy(const Kernel::XfrmPolicy& policy) {
    if (!policy.mainType || policy.selector.family != Kernel::kXfrmInet6) return false;
    if (policy.direction != Kernel::kXfrmIn && policy.direction != Kernel::kXfrmOut) return false;
    if (!ProtocolByNumber(policy.selector.protocol)) return false;
    if (policy.action == Kernel::kXfrmBlock) return true;
    if (policy.action != Kernel::kXfrmAllow || policy.templates.size() > 1) return false;
    if (policy.templates.empty()) return true;
    const auto& tmpl = policy.templates.front();
    return tmpl.protocol == Kernel::kXfrmEsp && tmpl.family == Kernel::kXfrmInet6 &&
           (tmpl.mode == Kernel::kXfrmTransport || tmpl.mode == Kernel::kXfrmTunnel);
}

std::uint32_t TableIndex(const std::vector<std::string>& table, const std::string& name) {
    auto it = std::find(table.begin(), table.end(), name);
    return it == table.end() ? 0 : static_cast<std::uint32_t>(it - table.begin());
}

// Why the kernel refused to add an association, in an administrator's words.
std::string AddRefusal(const Net::IpSecSadParam& sa, const Kernel::XfrmRefusal& refusal) {
    std::string head = "Cannot add Security Association '" + sa.name + "': ";
    const std::string& said = refusal.message;
    if (refusal.error == EPROTONOSUPPORT && said.find("mode") != std::string::npos)
        return head + "the kernel of this Linux host has no IPsec " + Impl::SA_MODE[sa.mode] +
               " mode for IPv6 (" + said + ")";
    if (refusal.error == EPROTONOSUPPORT)
        return head +
               "the kernel of this Linux host has no ESP for IPv6 (module esp6, CONFIG_INET6_ESP): IPsec "
               "security "
               "associations are not available" +
               (said.empty() ? std::string() : " (" + said + ")");
    if (refusal.error == ENOSYS || refusal.error == ENOENT) {
        std::string which = said.find("CRYPT") != std::string::npos
                                ? "the encryption algorithm " + Impl::SA_ENCPT_ALG[sa.encryptionAlgorithm]
                            : said.find("AUTH") != std::string::npos
                                ? "the integrity algorithm " + Impl::SA_AUTH_ALG[sa.integrityAlgorithm]
                                : "the algorithm " + Impl::SA_ENCPT_ALG[sa.encryptionAlgorithm] + " or " +
                                      Impl::SA_AUTH_ALG[sa.integrityAlgorithm];
        return head + "the kernel of this Linux host has no crypto module for " + which;
    }
    if (refusal.error == EEXIST)
        return head + "the kernel already has an IPsec state with destination " +
               Canonical(sa.destination.GetStringAddress()) + " and SPI " + Hex(sa.spi);
    return head + std::strerror(refusal.error) + (said.empty() ? std::string() : " (" + said + ")");
}

std::string Refusal(const std::string& head, const Kernel::XfrmRefusal& refusal) {
    return head + std::strerror(refusal.error) +
           (refusal.message.empty() ? std::string() : " (" + refusal.message + ")");
}

class LinuxIpsec final : public Backend::Ipsec {
public:
    explicit LinuxIpsec(Context& context) : context_(context) {}

    // ------------------------------------------------------------ associations

    std::vector<Net::IpSecSadParam> ListSas(bool shown) override {
        if (!shown) RefuseWithoutPrivilege();
        auto names = SaNames();
        std::vector<Net::IpSecSadParam> out;
        std::size_t hidden = 0;
        for (const auto& state : Kernel::ListStates(ns_)) {
            if (!IsAssociation(state)) {
                ++hidden;
                continue;
            }
            out.push_back(ToParam(state, names));
        }
        if (hidden && shown) {
            context_.Warn(
                Count(hidden, "IPsec state of the kernel is", "IPsec states of the kernel are") +
                " not shown: only IPv6 ESP states in transport or tunnel mode with the algorithms of "
                "'sa add' are Security Associations here");
        }
        return out;
    }

    void AddSa(const Net::IpSecSadParam& sa) override {
        context_.BeginChange();
        Kernel::XfrmState state;
        state.source = Canonical(sa.source.GetStringAddress());
        state.destination = Canonical(sa.destination.GetStringAddress());
        state.spi = sa.spi;
        state.mode = sa.mode == Net::IPSEC_MODE_TUNNEL ? Kernel::kXfrmTunnel : Kernel::kXfrmTransport;
        state.lifetimeSeconds = sa.lifetime;
        state.encryption =
            Algorithm(Kernel::EncryptionByName(Impl::SA_ENCPT_ALG.at(sa.encryptionAlgorithm)),
                      Impl::SA_ENCPT_ALG[sa.encryptionAlgorithm], sa.encryptionKey, "encryption");
        state.integrity = Algorithm(Kernel::IntegrityByName(Impl::SA_AUTH_ALG.at(sa.integrityAlgorithm)),
                                    Impl::SA_AUTH_ALG[sa.integrityAlgorithm], sa.integrityKey, "integrity");
        if (auto refusal = Kernel::Send(ns_, Kernel::BuildStateAdd(state)))
            throw HostCtlException(AddRefusal(sa, *refusal));

        // (A dry run added nothing to read back: the state is named as it was asked.)
        auto held =
            Kernel::DryRun() ? std::optional(state) : FindState(state.source, state.destination, state.spi);
        if (!held || !IsAssociation(*held) || held->mode != state.mode ||
            Kernel::EncryptionName(*held->encryption) != Impl::SA_ENCPT_ALG[sa.encryptionAlgorithm] ||
            Kernel::IntegrityName(*held->integrity) != Impl::SA_AUTH_ALG[sa.integrityAlgorithm]) {
            // Not left behind as if it had been added.
            if (held) Kernel::Send(ns_, Kernel::BuildStateDelete(*held));
            throw HostCtlException("The kernel does not hold Security Association '" + sa.name +
                                   "' as it was added");
        }
        auto names = SaNames();
        std::erase_if(names, [&](const SaName& n) { return n.name == sa.name || n.Matches(*held); });
        names.push_back({sa.name, sa.spi, state.source, state.destination});
        StoreSaNames(names);
    }

    void RemoveSa(const std::string& name) override {
        context_.RequireUndoable(kSaKeys);
        context_.BeginChange();
        auto names = SaNames();
        for (const auto& state : Kernel::ListStates(ns_)) {
            auto it = std::find_if(names.begin(), names.end(),
                                   [&](const SaName& n) { return n.name == name && n.Matches(state); });
            if (it == names.end() || !IsAssociation(state)) continue;
            Delete(state, "Cannot remove Security Association '" + name + "': ");
            names.erase(it);
            StoreSaNames(names);
            return;
        }
        throw HostCtlException("Security Association '" + name + "' does not exist");
    }

    void RemoveAutoSa(const Net::Ipv6Address& source, const Net::Ipv6Address& destination,
                      std::uint32_t spi) override {
        context_.RequireUndoable(kSaKeys);
        context_.BeginChange();
        auto names = SaNames();
        for (const auto& state : Kernel::ListStates(ns_)) {
            if (!IsAssociation(state) || state.spi != spi || state.source != source.GetStringAddress() ||
                state.destination != destination.GetStringAddress())
                continue;
            if (NameOf(state, names) != kAuto) continue;
            return Delete(state, "Cannot remove the automatic Security Association " + Hex(spi) + ": ");
        }
        throw HostCtlException("No automatic Security Association has source " + source.GetStringAddress() +
                               ", destination " + destination.GetStringAddress() + " and SPI " + Hex(spi));
    }

    void FlushSas() override {
        context_.RequireUndoable(kSaKeys);
        context_.BeginChange();
        for (const auto& state : Kernel::ListStates(ns_)) {
            if (IsAssociation(state))
                Delete(state, "Cannot remove the Security Association with SPI " + Hex(state.spi) + ": ");
        }
        StoreSaNames({});
    }

    // ------------------------------------------------------------ policies

    std::vector<Net::IpSecSpdParam> ListSps(bool shown) override {
        if (!shown) RefuseWithoutPrivilege();
        auto names = SpNames();
        std::optional<std::vector<Kernel::XfrmState>> states;
        std::vector<Net::IpSecSpdParam> out;
        std::size_t hidden = 0;
        auto policies = Kernel::ListPolicies(ns_);
        // The kernel numbers policies as they are made: listed in that order, as they were added.
        std::stable_sort(policies.begin(), policies.end(),
                         [](const auto& a, const auto& b) { return a.index < b.index; });
        for (const auto& policy : policies) {
            if (!IsPolicy(policy)) {
                ++hidden;
                continue;
            }
            Net::IpSecSpdParam sp = ToParam(policy, names);
            if (!policy.templates.empty() && policy.templates.front().spi != 0) {
                if (!states) states = Kernel::ListStates(ns_);
                sp.saName = SaNameOfTemplate(policy.templates.front(), *states);
            }
            out.push_back(std::move(sp));
        }
        if (hidden && shown) {
            context_.Warn(Count(hidden, "IPsec policy of the kernel is", "IPsec policies of the kernel are") +
                          " not shown: only main IPv6 policies in or out, for any, tcp, udp or icmp6, that "
                          "discard, pass or ask for one ESP state are Security Policies here");
        }
        return out;
    }

    void AddSp(const Net::IpSecSpdParam& sp) override {
        if (sp.spName.rfind(kUnnamedPrefix, 0) == 0) {
            throw HostCtlException(
                "Security Policy names starting with '" + std::string(kUnnamedPrefix) +
                "' are kept for the kernel's policies that have no name on this Linux host");
        }
        context_.BeginChange();
        Kernel::XfrmPolicy policy;
        auto& s = policy.selector;
        s.source = Canonical(sp.sourceAddress.GetStringAddress());
        s.sourcePrefix = sp.sourcePrefixLength;
        s.destination = Canonical(sp.destinationAddress.GetStringAddress());
        s.destinationPrefix = sp.destinationPrefixLength;
        s.sourcePort = static_cast<std::uint16_t>(sp.sourcePort);
        s.destinationPort = static_cast<std::uint16_t>(sp.destinationPort);
        s.protocol = kProtocols[sp.protocol].number;
        policy.direction = sp.direction == Net::IPSEC_DIRECTION_IN ? Kernel::kXfrmIn : Kernel::kXfrmOut;
        policy.action = sp.action == Net::IPSEC_ACTION_DISCARD ? Kernel::kXfrmBlock : Kernel::kXfrmAllow;
        if (sp.action == Net::IPSEC_ACTION_IPSEC) {
            Kernel::XfrmTemplate tmpl;
            tmpl.mode = sp.mode == Net::IPSEC_MODE_TUNNEL ? Kernel::kXfrmTunnel : Kernel::kXfrmTransport;
            if (!sp.saName.empty()) {
                auto names = SaNames();
                auto it = std::find_if(names.begin(), names.end(),
                                       [&](const SaName& n) { return n.name == sp.saName; });
                if (it == names.end())
                    throw HostCtlException("Security Association '" + sp.saName + "' does not exist");
                tmpl.spi = it->spi;
                tmpl.source = it->source;
                tmpl.destination = it->destination;
            }
            policy.templates.push_back(tmpl);
        }
        auto names = SpNames();
        for (const auto& existing : Kernel::ListPolicies(ns_)) {
            if (existing.direction == policy.direction && existing.selector == s && existing.mainType) {
                throw HostCtlException("Cannot add Security Policy '" + sp.spName + "': Security Policy '" +
                                       NameOf(existing, names) +
                                       "' already covers the same addresses, ports, protocol and direction");
            }
        }
        if (auto refusal = Kernel::Send(ns_, Kernel::BuildPolicyAdd(policy)))
            throw HostCtlException(Refusal("Cannot add Security Policy '" + sp.spName + "': ", *refusal));

        auto held = Kernel::DryRun() ? std::optional(policy) : FindPolicy(s, policy.direction);
        if (!held || held->action != policy.action || held->templates != policy.templates) {
            if (held) Kernel::Send(ns_, Kernel::BuildPolicyDelete(*held));
            throw HostCtlException("The kernel does not hold Security Policy '" + sp.spName +
                                   "' as it was added");
        }
        std::erase_if(names, [&](const SpName& n) { return n.name == sp.spName || n.Matches(*held); });
        names.push_back({sp.spName, s, policy.direction});
        StoreSpNames(names);
    }

    void RemoveSp(const std::string& name) override {
        context_.BeginChange();
        auto names = SpNames();
        for (const auto& policy : Kernel::ListPolicies(ns_)) {
            if (!IsPolicy(policy) || NameOf(policy, names) != name) continue;
            DeletePolicy(policy, "Cannot remove Security Policy '" + name + "': ");
            std::erase_if(names, [&](const SpName& n) { return n.name == name; });
            StoreSpNames(names);
            return;
        }
        throw HostCtlException("Security Policy '" + name + "' does not exist");
    }

    void FlushSps() override {
        context_.BeginChange();
        auto names = SpNames();
        for (const auto& policy : Kernel::ListPolicies(ns_)) {
            if (IsPolicy(policy))
                DeletePolicy(policy, "Cannot remove Security Policy '" + NameOf(policy, names) + "': ");
        }
        StoreSpNames({});
    }

private:
    // A list for the checks of a change: without the privilege the change needs, the kernel
    // would refuse the list already; the user hears what the change needs.
    static void RefuseWithoutPrivilege() {
        if (!Context::HasNetAdmin()) throw HostCtlException(Context::kNeedsRoot);
    }

    // ------------------------------------------------------------ the kernel

    std::optional<Kernel::XfrmState> FindState(const std::string& source, const std::string& destination,
                                               std::uint32_t spi) {
        for (auto& state : Kernel::ListStates(ns_)) {
            if (state.spi == spi && state.source == source && state.destination == destination &&
                state.protocol == Kernel::kXfrmEsp)
                return state;
        }
        return std::nullopt;
    }

    std::optional<Kernel::XfrmPolicy> FindPolicy(const Kernel::XfrmSelector& selector, int direction) {
        for (auto& policy : Kernel::ListPolicies(ns_)) {
            if (policy.direction == direction && policy.selector == selector && policy.mainType)
                return policy;
        }
        return std::nullopt;
    }

    void Delete(const Kernel::XfrmState& state, const std::string& head) {
        if (auto refusal = Kernel::Send(ns_, Kernel::BuildStateDelete(state)))
            throw HostCtlException(Refusal(head, *refusal));
        if (!Kernel::DryRun() && FindState(state.source, state.destination, state.spi))
            throw HostCtlException(head + "the kernel still holds it");
    }

    void DeletePolicy(const Kernel::XfrmPolicy& policy, const std::string& head) {
        if (auto refusal = Kernel::Send(ns_, Kernel::BuildPolicyDelete(policy)))
            throw HostCtlException(Refusal(head, *refusal));
        if (!Kernel::DryRun() && FindPolicy(policy.selector, policy.direction))
            throw HostCtlException(head + "the kernel still holds it");
    }

    // An algorithm of the commands with its key. The kernel takes keys of the algorithm's size
    // only: an ASCII key is refused here with what it needs rather than by the kernel.
    static Kernel::XfrmAlgorithm Algorithm(std::optional<Kernel::XfrmAlgorithm> algorithm,
                                           const std::string& name, const std::string& key,
                                           const char* what) {
        if (!algorithm) throw HostCtlException("Unknown " + std::string(what) + " algorithm " + name);
        algorithm->key = Kernel::KeyBytes(key);
        const std::size_t bytes = algorithm->keyBits / 8;
        if (algorithm->key.size() != bytes) {
            throw HostCtlException("The " + std::string(what) + " key for " + name + " must be " +
                                   std::to_string(bytes) + " bytes (" + std::to_string(algorithm->keyBits) +
                                   " bits) on a Linux host: " + std::to_string(bytes) +
                                   " ASCII characters or 0x and " + std::to_string(2 * bytes) +
                                   " hexadecimal digits, not " + std::to_string(algorithm->key.size()) +
                                   " bytes");
        }
        return *algorithm;
    }

    // ------------------------------------------------------------ names

    static std::string NameOf(const Kernel::XfrmState& state, const std::vector<SaName>& names) {
        for (const auto& n : names) {
            if (n.Matches(state)) return n.name;
        }
        return kAuto;
    }

    static std::string NameOf(const Kernel::XfrmPolicy& policy, const std::vector<SpName>& names) {
        for (const auto& n : names) {
            if (n.Matches(policy)) return n.name;
        }
        return kUnnamedPrefix + std::to_string(policy.index);
    }

    // The association a policy's template asks for: its name, "auto" for one the document does
    // not name, "UNKNOWN" once it is gone.
    std::string SaNameOfTemplate(const Kernel::XfrmTemplate& tmpl,
                                 const std::vector<Kernel::XfrmState>& states) {
        auto names = SaNames();
        for (const auto& state : states) {
            if (state.spi != tmpl.spi || state.protocol != tmpl.protocol) continue;
            if (tmpl.destination != "::" && state.destination != tmpl.destination) continue;
            return NameOf(state, names);
        }
        return Impl::UNKNOWN_SA_NAME;
    }

    Net::IpSecSadParam ToParam(const Kernel::XfrmState& state, const std::vector<SaName>& names) const {
        Net::IpSecSadParam sa;
        sa.name = NameOf(state, names);
        sa.state = state.spi == 0 ? Net::IPSEC_SA_STATE_LARVAL : Net::IPSEC_SA_STATE_MATURE;
        sa.lifetime = static_cast<std::uint32_t>(
            std::min<std::uint64_t>(state.lifetimeSeconds, std::numeric_limits<std::uint32_t>::max()));
        sa.spi = state.spi;
        sa.source = Net::Ipv6Address(state.source);
        sa.destination = Net::Ipv6Address(state.destination);
        sa.mode = state.mode == Kernel::kXfrmTunnel ? Net::IPSEC_MODE_TUNNEL : Net::IPSEC_MODE_TRANSPORT;
        sa.encryptionAlgorithm = static_cast<Net::IpSecEncryptAlgo>(
            TableIndex(Impl::SA_ENCPT_ALG, Kernel::EncryptionName(*state.encryption)));
        sa.integrityAlgorithm = static_cast<Net::IpSecAuthAlgo>(
            TableIndex(Impl::SA_AUTH_ALG, Kernel::IntegrityName(*state.integrity)));
        return sa;
    }

    static Net::IpSecSpdParam ToParam(const Kernel::XfrmPolicy& policy, const std::vector<SpName>& names) {
        Net::IpSecSpdParam sp;
        const auto& s = policy.selector;
        sp.spName = NameOf(policy, names);
        sp.sourceAddress = Net::Ipv6Address(s.source);
        sp.sourcePrefixLength = s.sourcePrefix;
        sp.destinationAddress = Net::Ipv6Address(s.destination);
        sp.destinationPrefixLength = s.destinationPrefix;
        sp.sourcePort = s.sourcePort;
        sp.destinationPort = s.destinationPort;
        sp.protocol = ProtocolByNumber(s.protocol)->type;
        sp.direction =
            policy.direction == Kernel::kXfrmIn ? Net::IPSEC_DIRECTION_IN : Net::IPSEC_DIRECTION_OUT;
        if (policy.action == Kernel::kXfrmBlock) {
            sp.action = Net::IPSEC_ACTION_DISCARD;
        } else if (policy.templates.empty()) {
            sp.action = Net::IPSEC_ACTION_NONE;
        } else {
            sp.action = Net::IPSEC_ACTION_IPSEC;
            sp.mode = policy.templates.front().mode == Kernel::kXfrmTunnel ? Net::IPSEC_MODE_TUNNEL
                                                                           : Net::IPSEC_MODE_TRANSPORT;
        }
        return sp;
    }

    // ------------------------------------------------------------ the document

    const json& Member(const char* list) {
        const json& member = context_.GetDocument().Read(kMember);
        if (member.is_null()) return member;
        if (!member.is_object()) context_.GetDocument().Refuse(kMember, "not an object");
        auto it = member.find(list);
        if (it == member.end()) {
            static const json empty = json::array();
            return empty;
        }
        if (!it->is_array()) context_.GetDocument().Refuse(kMember, std::string(list) + " is not a list");
        return *it;
    }

    std::string Text(const json& entry, const char* key, const char* list) {
        auto it = entry.find(key);
        if (it == entry.end() || !it->is_string())
            context_.GetDocument().Refuse(kMember,
                                          std::string(list) + ": an entry has no text \"" + key + "\"");
        return it->get<std::string>();
    }

    std::uint32_t Number(const json& entry, const char* key, const char* list, std::uint32_t max) {
        auto it = entry.find(key);
        if (it == entry.end() || !it->is_number_unsigned() || it->get<std::uint64_t>() > max)
            context_.GetDocument().Refuse(kMember, std::string(list) + ": an entry has no number \"" + key +
                                                       "\" from 0 to " + std::to_string(max));
        return it->get<std::uint32_t>();
    }

    std::string Address(const json& entry, const char* key, const char* list) {
        std::string text = Text(entry, key, list);
        if (!Net::Ipv6Address::IsValidAddress(text))
            context_.GetDocument().Refuse(kMember,
                                          std::string(list) + ": \"" + key + "\" is no IPv6 address");
        return Canonical(text);
    }

    std::pair<std::string, unsigned> Network(const json& entry, const char* key) {
        std::string text = Text(entry, key, "sps");
        if (!Net::Ipv6Network::IsValidAddressAndNetmask(text))
            context_.GetDocument().Refuse(kMember, std::string("sps: \"") + key + "\" is no IPv6 network");
        Net::Ipv6Network network(text);
        return {network.GetAddress().GetStringAddress(), network.GetNetmask()};
    }

    std::vector<SaName> SaNames() {
        std::vector<SaName> names;
        for (const auto& entry : Member("sas")) {
            if (!entry.is_object()) context_.GetDocument().Refuse(kMember, "sas: an entry is not an object");
            names.push_back({Text(entry, "name", "sas"), Number(entry, "spi", "sas", 0xffffffffu),
                             Address(entry, "source", "sas"), Address(entry, "destination", "sas")});
        }
        return names;
    }

    std::vector<SpName> SpNames() {
        std::vector<SpName> names;
        for (const auto& entry : Member("sps")) {
            if (!entry.is_object()) context_.GetDocument().Refuse(kMember, "sps: an entry is not an object");
            SpName n;
            n.name = Text(entry, "name", "sps");
            std::tie(n.selector.source, n.selector.sourcePrefix) = Network(entry, "source");
            std::tie(n.selector.destination, n.selector.destinationPrefix) = Network(entry, "destination");
            n.selector.sourcePort = static_cast<std::uint16_t>(Number(entry, "sourcePort", "sps", 65535));
            n.selector.destinationPort =
                static_cast<std::uint16_t>(Number(entry, "destinationPort", "sps", 65535));
            std::string protocol = Text(entry, "protocol", "sps");
            auto p = std::find_if(std::begin(kProtocols), std::end(kProtocols),
                                  [&](const Protocol& candidate) { return protocol == candidate.name; });
            if (p == std::end(kProtocols))
                context_.GetDocument().Refuse(kMember, "sps: unknown protocol " + protocol);
            n.selector.protocol = p->number;
            std::string direction = Text(entry, "direction", "sps");
            if (direction != "in" && direction != "out")
                context_.GetDocument().Refuse(kMember, "sps: unknown direction " + direction);
            n.direction = direction == "in" ? Kernel::kXfrmIn : Kernel::kXfrmOut;
            names.push_back(std::move(n));
        }
        return names;
    }

    // Names are stored for what the kernel holds now: names of states and policies that are
    // gone are dropped with each change.
    void StoreSaNames(std::vector<SaName> names) {
        auto states = Kernel::ListStates(ns_);
        std::erase_if(names, [&](const SaName& n) {
            return std::none_of(states.begin(), states.end(), [&](const auto& s) { return n.Matches(s); });
        });
        json list = json::array();
        for (const auto& n : names)
            list.push_back(
                {{"name", n.name}, {"spi", n.spi}, {"source", n.source}, {"destination", n.destination}});
        Store("sas", std::move(list));
    }

    void StoreSpNames(std::vector<SpName> names) {
        auto policies = Kernel::ListPolicies(ns_);
        std::erase_if(names, [&](const SpName& n) {
            return std::none_of(policies.begin(), policies.end(),
                                [&](const auto& p) { return n.Matches(p); });
        });
        json list = json::array();
        for (const auto& n : names) {
            const auto& s = n.selector;
            list.push_back({{"name", n.name},
                            {"source", s.source + "/" + std::to_string(s.sourcePrefix)},
                            {"destination", s.destination + "/" + std::to_string(s.destinationPrefix)},
                            {"sourcePort", s.sourcePort},
                            {"destinationPort", s.destinationPort},
                            {"protocol", ProtocolByNumber(s.protocol)->name},
                            {"direction", n.direction == Kernel::kXfrmIn ? "in" : "out"}});
        }
        Store("sps", std::move(list));
    }

    void Store(const char* list, json value) {
        const json& current = context_.GetDocument().Read(kMember);
        if (value.empty() && (!current.is_object() || !current.contains(list))) return;
        json& member = context_.GetDocument().Write(kMember);
        if (!member.is_object()) member = json::object();
        member[list] = std::move(value);
    }

    Context& context_;
    const Kernel::Namespace ns_ = Kernel::Namespace::Own();
};

}  // namespace

std::unique_ptr<Backend::Ipsec> MakeIpsec(Context& context) {
    return std::make_unique<LinuxIpsec>(context);
}

}  // namespace TknCtl::Linux

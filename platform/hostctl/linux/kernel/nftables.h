// The host firewall in nftables: one table of its own, "inet hadro", never any other. It is
// written as a whole, in one transaction, and read as a whole, through libnftables' JSON
// interface; BuildFirewall and ParseFirewall turn plain values into commands and listings into
// plain values, so that both are tested without a kernel.
//
//     table inet hadro {
//         set sshServer_v4 { type ipv4_addr; flags interval; elements = { 192.0.2.0/24 } }
//         set sshServer_v6 { type ipv6_addr; flags interval; }
//         chain input {                        # the firewall: its policy is the default action
//             type filter hook input priority filter; policy drop;
//             iifname "lo" accept              # what a host needs whatever its rulesets
//             ct state established,related accept
//             meta l4proto ipv6-icmp accept
//             jump sshServer                   # each enabled ruleset
//             jump runtime                     # rules added at run time (dynamic rules)
//         }
//         chain sshServer {                    # an enabled ruleset: its rules
//             ip saddr @sshServer_v4 tcp dport 22 accept comment "inbound"
//             ip6 saddr @sshServer_v6 tcp dport 22 accept comment "inbound"
//         }
//         chain runtime { }
//     }
//
// A disabled firewall keeps its rulesets' chains and sets, and its input chain accepts
// everything (policy accept, no rule). A ruleset that allows all addresses has no address
// match. The firewall filters what comes in: a rule for inbound traffic matches the port as
// given, a rule for outbound traffic matches the replies (a destination port of outbound
// traffic is the source port of its replies); each rule's comment says which it is.
//
// libnftables is loaded (dlopen) when the firewall is first used: its dependencies cost more
// to load than a whole read of the host.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace TknCtl::Linux::Kernel {

constexpr const char* kFirewallFamily = "inet";
constexpr const char* kFirewallTable = "hadro";
// The refusal of a read or change without the privilege the kernel asks for.
constexpr const char* kFirewallNeedsRoot =
    "The firewall of this Linux host is read and changed only by root (CAP_NET_ADMIN): the kernel shows its "
    "nftables to no other user";
// Chains of the table other than the rulesets'.
constexpr const char* kInputChain = "input";
constexpr const char* kRuntimeChain = "runtime";

// A port rule, with the codes of HostCtl::System::FirewallRule.
struct NftRule {
    std::uint32_t portType = 1;  // 1 destination port, 0 source port
    std::uint32_t portBegin = 0;
    std::uint32_t portEnd = 0;
    std::uint32_t direction = 0;  // 0 inbound, 1 outbound
    std::uint32_t protocol = 0;   // 0 TCP, 1 UDP
    bool operator==(const NftRule& other) const = default;
};

// An enabled ruleset: a chain of its name, and its allowed addresses in the sets NAME_v4 and
// NAME_v6 (kept while all addresses are allowed, though unused then).
struct NftRuleset {
    std::string name;
    std::vector<NftRule> rules;
    bool allowedAll = true;
    std::vector<std::string> allowed;  // canonical addresses and networks (CanonicalAllowed)
};

struct NftFirewall {
    bool enabled = false;  // the input chain filters
    bool pass = true;      // its policy while it filters: accept (true) or drop
    std::vector<NftRuleset> rulesets;
    std::vector<NftRule> dynamicRules;
};

// Whether the table holds what was asked: the same switches, the same rulesets with the same
// rules and allowed entries (in any order), the same dynamic rules. Empty when it does;
// otherwise what differs, for a message.
std::string Difference(const NftFirewall& asked, const NftFirewall& held);

// The text of an allowed entry as the table keeps it: an address in its standard form, a
// network with its host bits cleared ("192.0.2.0/24"); a network of one address is that
// address. Nothing for text that is neither.
std::optional<std::string> CanonicalAllowed(const std::string& text);
// Whether two canonical entries overlap (an address inside a network, a network inside
// another): a set of the table cannot hold both.
bool Overlaps(const std::string& a, const std::string& b);

// The commands (libnftables JSON) that replace the table by one holding firewall: one
// transaction, so that the table changes at once or not at all.
std::string BuildFirewall(const NftFirewall& firewall);
// The commands that delete the table.
std::string BuildFirewallDelete();
// The table's listing ("list table inet hadro", JSON) as a plain value. What the table holds
// that the firewall did not make (another chain's rules, a rule it cannot read) is left out,
// each described in unknown. Throws HostCtlException for a listing that is no JSON.
NftFirewall ParseFirewall(const std::string& listing, std::vector<std::string>* unknown = nullptr);

// Whether nft's language takes name as a chain's name: a word of the language ("ip", "accept")
// is not, and a table with such a chain could not be read back from its own listing.
bool IsNftName(const std::string& name);

// libnftables, loaded from a library file on first use.
class Nftables {
public:
    // The process's library (libnftables.so.1), loaded once. Throws HostCtlException saying
    // that the firewall is not available when it cannot be loaded.
    static Nftables& Get();
    // A library by its file name or path.
    explicit Nftables(const std::string& library);
    ~Nftables();
    Nftables(const Nftables&) = delete;
    Nftables& operator=(const Nftables&) = delete;

    struct Result {
        bool ok = false;
        std::string output;  // JSON for a listing
        std::string error;   // libnftables' error text
    };
    // Runs commands, as nft text or as JSON ({"nftables": [...]}), in one transaction.
    Result Run(const std::string& commands);
    // The same, checked by the kernel and abandoned: nothing is changed (nft --check).
    Result Check(const std::string& commands);

private:
    struct Library;
    std::unique_ptr<Library> library_;
};

// The table as the kernel holds it now; nothing when there is none. Throws HostCtlException
// (the kernel shows nftables only to CAP_NET_ADMIN). unknown as for ParseFirewall.
std::optional<NftFirewall> ReadFirewall(std::vector<std::string>* unknown = nullptr);
// Replaces the table by one holding firewall / deletes it, each in one transaction; throws
// HostCtlException with libnftables' reason when the kernel refuses.
void WriteFirewall(const NftFirewall& firewall);
void DeleteFirewall();

}  // namespace TknCtl::Linux::Kernel

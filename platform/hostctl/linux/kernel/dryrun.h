// Dry runs of the Linux host: every change the kernel layer would make (a netlink request, a
// sysctl or file written, a namespace made or removed, the firewall's nftables table, an ethtool
// request) is recorded as one line instead of being made, where it would be made:
//
//     kernel: route add 10.2.0.0/16 via 10.1.0.1 dev eth0 table main (netstack defaultTcpipStack)
//
// (kernel/describe.h words the lines). Reads still reach the kernel, so that the checks of a
// change and the host's refusals run as for real. A later step of a change often needs what an
// earlier one would have made, so what a dry run would do is kept as plans that later reads see:
// links made, changed or deleted (every list of links of a namespace, ListLinks, FindLink and
// ListBridgeLinks, shows them as the kernel would, a link made with a placeholder index from
// kPlannedIndex on), settings (sysctls) and resolver files written, the firewall's table, IPsec
// states and policies added or deleted; a namespace a dry run would make reads as empty but for
// them. (Addresses, routes, neighbours, queueing disciplines, bridge port flags and VLANs and
// forwarding entries are read as the kernel holds them.) Where a step needs what cannot be known
// without the change (what lies inside a namespace that does not exist, an address the kernel
// would pick), StopDryRun records what the real run would do next and ends the dry run there.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "kernel/bridges.h"
#include "kernel/links.h"
#include "kernel/netlink.h"
#include "kernel/nftables.h"
#include "kernel/xfrm.h"

struct nlmsghdr;

namespace TknCtl::Linux::Kernel {

struct VethPair;

// How the lines name the program's own namespace: the host's default netstack.
constexpr const char* kOwnNetstack = "defaultTcpipStack";
// The first placeholder index of a link a dry run would make (far above any the kernel gives).
constexpr int kPlannedIndex = 1 << 30;

// Receives each line of a dry run; last marks the line that ends it early.
using DryRunRecorder = std::function<void(const std::string& line, bool last)>;

// Starts a dry run for the rest of the process, or ends it with an empty recorder (tests); the
// plans of the last one are forgotten either way.
void SetDryRun(DryRunRecorder record);
bool DryRun();

// Records a change: "kernel: WHAT (netstack NAME)" for one made in a namespace, "kernel: WHAT"
// for one that is not (a file).
void Record(const std::string& what, const Namespace& ns);
void Record(const std::string& what);
// Ends a dry run where it cannot go further: records "dry run ends here: the real run would
// next NEXT" and throws HostCtl::Lib::DryRunEnd.
[[noreturn]] void StopDryRun(const std::string& next);

// The netstack a namespace is in the lines: kOwnNetstack for the program's own.
std::string NetstackName(const Namespace& ns);

// ---------------------------------------------------------------- plans of links

// What a dry run would do to one link of a namespace.
struct LinkPlan {
    std::string ns;  // the namespace's name; empty for the program's own
    int index = 0;   // the kernel's, or a placeholder for a link the dry run would make
    bool made = false;
    bool gone = false;
    std::string name;  // of a link made
    std::string kind;  // of a link made: "veth", "bridge"
    std::string mac;   // of a link made: empty when the kernel would choose it
    unsigned mtu = 0;  // of a link made: 0 for the kernel's (1500)
    unsigned rxQueues = 0, gsoMaxSize = 0;
    int peer = 0;        // of a veth made: the other end's placeholder
    std::string peerNs;  // and its namespace's name
    LinkChange change;   // what later requests change of it
    // Its IPv6 settings written (the sysctls of net/ipv6/conf/DEVICE).
    std::optional<bool> ipv6Disabled;
    std::optional<int> acceptRa;
};

// The plans of the current dry run (none outside one).
const std::vector<LinkPlan>& LinkPlans();
// The plan of a link (by its namespace and index), or nullptr.
const LinkPlan* FindLinkPlan(const Namespace& ns, int index);

// The links of a namespace as the plans leave them: links gone are left out, changes applied,
// links made added (in index order, after the kernel's), each as a fresh device of its kind is.
void ApplyLinkPlans(const std::vector<LinkPlan>& plans, const std::string& ns, std::vector<Link>& links);
void ApplyLinkPlans(const std::vector<LinkPlan>& plans, const std::string& ns,
                    std::vector<BridgeLink>& links);
// The kernel's answer for one link (FindLink) as the plans leave it; a link made is found by name.
std::optional<Link> ApplyLinkPlans(const std::vector<LinkPlan>& plans, const std::string& ns,
                                   const std::string& name, std::optional<Link> found);

// What a dry run records of its requests: a veth pair made (both ends, in their namespaces), a
// link request (RTM_NEWLINK, RTM_SETLINK, RTM_DELLINK) made, changed or deleted.
void PlanVeth(const Namespace& ns, const VethPair& pair, const Namespace& peerNs);
void PlanLinkRequest(const Namespace& ns, const nlmsghdr* request);

// ---------------------------------------------------------------- namespaces

// A namespace a dry run would make (and has not removed again); it reads as empty.
bool IsPlannedNamespace(const Namespace& ns);
bool IsPlannedNamespace(const std::string& name);
// The names of the namespaces a dry run would make.
std::vector<std::string> PlannedNamespaces();
void PlanNamespace(const std::string& name, bool made);

// A request of rtnetlink (a link, an address, a route, a neighbour, a bridge port's flags or
// VLANs, a forwarding entry) made during a dry run: recorded and planned, not sent.
void RehearseRequest(const Namespace& ns, const nlmsghdr* request);

// ---------------------------------------------------------------- settings, files, the firewall

// A setting written ("ipv6/conf/tkn0/accept_ra"), as later reads find it; an IPv6 setting of a
// device is also what the device's link reports.
void PlanSysctl(const Namespace& ns, const std::string& name, const std::string& value);
std::optional<std::string> PlannedSysctl(const Namespace& ns, const std::string& name);
// A file written (by its real path), as later reads find it.
void PlanFile(const std::string& path, const std::string& text);
std::optional<std::string> PlannedFile(const std::string& path);
// The firewall's table written (or deleted: nothing); PlannedFirewall is empty while the dry
// run has neither written nor deleted it.
void PlanFirewall(std::optional<NftFirewall> firewall);
const std::optional<std::optional<NftFirewall>>& PlannedFirewall();
// An xfrm request (a state or a policy added or deleted); the states and policies of a namespace
// as the requests planned leave them (a policy added gets a placeholder index).
void PlanXfrmRequest(const Namespace& ns, nl_msg* request);
void ApplyXfrmPlans(const Namespace& ns, std::vector<XfrmState>& states);
void ApplyXfrmPlans(const Namespace& ns, std::vector<XfrmPolicy>& policies);

}  // namespace TknCtl::Linux::Kernel

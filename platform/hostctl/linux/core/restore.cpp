#include "core/restore.h"

#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <map>
#include <nlohmann/json.hpp>
#include <set>

#include "core/context.h"
#include "hostctl/exception.h"
#include "kernel/addresses.h"
#include "kernel/links.h"
#include "kernel/namespaces.h"
#include "kernel/neighbours.h"
#include "kernel/nftables.h"
#include "kernel/resolv.h"
#include "kernel/routes.h"
#include "kernel/sysctl.h"
#include "kernel/veth.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;
using Action = RestoreStep::Action;

namespace {

// The kinds of device the host makes and removes; other devices are only set.
bool Makeable(const std::string& kind) {
    return kind == "veth" || kind == "bridge";
}

RestoreStep Step(Action action, const std::string& netstack, const std::string& name = {}) {
    RestoreStep step;
    step.action = action;
    step.netstack = netstack;
    step.name = name;
    return step;
}

std::string Where(const std::string& netstack) {
    return netstack.empty() || netstack == Context::kDefaultNetstack ? std::string()
                                                                     : " (netstack " + netstack + ")";
}

std::string AddressText(const SavedAddress& a) {
    return a.address + "/" + std::to_string(a.prefixLength);
}

std::string RouteText(const SavedRoute& r) {
    std::string text =
        r.prefixLength == 0 ? std::string("default") : r.destination + "/" + std::to_string(r.prefixLength);
    for (const auto& hop : r.nexthops) {
        if (!hop.gateway.empty()) text += " via " + hop.gateway;
        if (!hop.device.empty()) text += " dev " + hop.device;
    }
    if (r.metric) text += " metric " + std::to_string(r.metric);
    if (r.table != 254) text += " table " + std::to_string(r.table);
    return text;
}

std::string PolicyText(const SavedPolicy& p) {
    static const char* const kDirections[] = {"in", "out", "fwd"};
    const auto& s = p.selector;
    return std::string("xfrm policy ") + s.source + "/" + std::to_string(s.sourcePrefix) + " to " +
           s.destination + "/" + std::to_string(s.destinationPrefix) + " dir " +
           (p.direction >= 0 && p.direction <= 2 ? kDirections[p.direction] : "?");
}

// ---------------------------------------------------------------- phases

void PlanNetstacks(const Snapshot& live, const Snapshot& wanted, std::vector<RestoreStep>& steps) {
    for (const auto& n : live.netstacks) {
        if (!wanted.FindNetstack(n.name)) steps.push_back(Step(Action::kDeleteNetstack, n.name, n.name));
    }
    for (const auto& n : wanted.netstacks) {
        const SavedNetstack* now = live.FindNetstack(n.name);
        if (!now) steps.push_back(Step(Action::kAddNetstack, n.name, n.name));
        if (n.name == Context::kDefaultNetstack) continue;
        const bool hasFiles = now && now->hasFiles;
        if (n.hasFiles && !hasFiles) steps.push_back(Step(Action::kMakeNetstackFiles, n.name, n.name));
        if (!n.hasFiles && hasFiles) steps.push_back(Step(Action::kRemoveNetstackFiles, n.name, n.name));
    }
}

bool SamePeer(const SavedLink& a, const SavedLink& b) {
    return a.peerNetstack == b.peerNetstack && a.peerName == b.peerName;
}

// A device of the same name made anew (another interface index) while the one of the
// checkpoint's index could be had again: no other device holds that index.
bool MadeAnew(const SavedNetstack& live, const SavedLink& link, const SavedLink& want) {
    if (want.index == 0 || link.index == want.index) return false;
    return std::none_of(live.links.begin(), live.links.end(), [&](const SavedLink& other) {
        return other.index == want.index && other.name != link.name;
    });
}

void PlanLinks(const Snapshot& live, const Snapshot& wanted, std::vector<RestoreStep>& steps) {
    // Removed first: what is new, what is of another kind or joined to another end, and what
    // was made anew under its name (its addresses, the rules that name its index, are not the
    // checkpoint's).
    std::set<std::pair<std::string, std::string>> gone;
    for (const auto& n : live.netstacks) {
        const SavedNetstack* w = wanted.FindNetstack(n.name);
        if (!w) continue;
        for (const auto& link : n.links) {
            if (!Makeable(link.kind)) continue;
            // A veth whose other end is in no netstack of the host is someone else's.
            if (link.kind == "veth" && link.peerName.empty()) continue;
            if (gone.count({n.name, link.name})) continue;
            const SavedLink* want = w->FindLink(link.name);
            if (want && want->kind == link.kind && (link.kind != "veth" || SamePeer(*want, link)) &&
                !MadeAnew(n, link, *want))
                continue;
            steps.push_back(Step(Action::kDeleteLink, n.name, link.name));
            gone.insert({n.name, link.name});
            if (link.kind == "veth") gone.insert({link.peerNetstack, link.peerName});
        }
    }
    // Then what is missing is made: bridges, and veth pairs (once for both ends).
    std::set<std::pair<std::string, std::string>> made;
    for (const auto& w : wanted.netstacks) {
        const SavedNetstack* n = live.FindNetstack(w.name);
        for (const auto& link : w.links) {
            const SavedLink* now = n ? n->FindLink(link.name) : nullptr;
            if (now && !gone.count({w.name, link.name})) continue;
            if (made.count({w.name, link.name})) continue;
            if (link.kind == "bridge") {
                RestoreStep step = Step(Action::kAddBridge, w.name, link.name);
                step.link = link;
                steps.push_back(std::move(step));
            } else if (link.kind == "veth" && !link.peerName.empty()) {
                const SavedNetstack* peerNetstack = wanted.FindNetstack(link.peerNetstack);
                const SavedLink* peer = peerNetstack ? peerNetstack->FindLink(link.peerName) : nullptr;
                if (!peer) {
                    RestoreStep step = Step(Action::kCannot, w.name, link.name);
                    step.value =
                        "veth " + link.name + " cannot be made again: its other end is not in the checkpoint";
                    steps.push_back(std::move(step));
                    continue;
                }
                // The kernel registers the peer first: of two ends in one netstack the one of
                // the lower index is the peer, so that both list in the order they had.
                const bool swap = link.peerNetstack == w.name && peer->index > link.index;
                RestoreStep step = Step(Action::kAddVeth, w.name, swap ? peer->name : link.name);
                step.link = swap ? *peer : link;
                step.peer = swap ? link : *peer;
                step.peerNetstack = link.peerNetstack;
                steps.push_back(std::move(step));
                made.insert({link.peerNetstack, link.peerName});
            } else if (!now) {
                RestoreStep step = Step(Action::kCannot, w.name, link.name);
                step.value = "device " + link.name + (link.kind.empty() ? "" : " (" + link.kind + ")") +
                             " is gone and cannot be made again";
                steps.push_back(std::move(step));
            }
            made.insert({w.name, link.name});
        }
    }
}

void PlanLinkSettings(const Snapshot& live, const Snapshot& wanted, std::vector<RestoreStep>& steps) {
    struct Pair {
        const SavedNetstack* netstack;
        const SavedLink* want;
        const SavedLink* now;
    };
    std::vector<Pair> pairs;
    for (const auto& w : wanted.netstacks) {
        const SavedNetstack* n = live.FindNetstack(w.name);
        if (!n) continue;
        // The netstack's own settings before its links': "all" reaches every device.
        for (const auto& [name, value] : w.sysctls) {
            auto it = n->sysctls.find(name);
            if (it == n->sysctls.end() || it->second == value) continue;
            RestoreStep step = Step(Action::kSetSysctl, w.name, name);
            step.value = value;
            steps.push_back(std::move(step));
        }
        for (const auto& link : w.links) {
            if (const SavedLink* now = n->FindLink(link.name)) pairs.push_back({&w, &link, now});
        }
    }
    auto each = [&](auto&& plan) {
        for (const auto& p : pairs)
            plan(p.netstack->name, *p.want, *p.now);
    };
    each([&](const std::string& ns, const SavedLink& want, const SavedLink& now) {
        if (want.master == now.master) return;
        RestoreStep step = Step(Action::kSetMaster, ns, want.name);
        step.value = want.master;
        steps.push_back(std::move(step));
    });
    each([&](const std::string& ns, const SavedLink& want, const SavedLink& now) {
        if (want.mtu == now.mtu || want.mtu == 0) return;
        RestoreStep step = Step(Action::kSetMtu, ns, want.name);
        step.number = want.mtu;
        steps.push_back(std::move(step));
    });
    each([&](const std::string& ns, const SavedLink& want, const SavedLink& now) {
        if (want.mac == now.mac || want.mac.empty()) return;
        RestoreStep step = Step(Action::kSetMac, ns, want.name);
        step.value = want.mac;
        steps.push_back(std::move(step));
    });
    each([&](const std::string& ns, const SavedLink& want, const SavedLink& now) {
        if (!want.vlanFiltering || !now.vlanFiltering || *want.vlanFiltering == *now.vlanFiltering) return;
        RestoreStep step = Step(Action::kSetVlanFiltering, ns, want.name);
        step.on = *want.vlanFiltering;
        steps.push_back(std::move(step));
    });
    each([&](const std::string& ns, const SavedLink& want, const SavedLink& now) {
        // A port's flags, VLANs and entries once it is a port of the bridge it should be.
        if (!want.port || !now.port || want.master != now.master) return;
        SavedPortFlags flags = *want.port;
        if (!now.port->locked) flags.locked.reset();
        SavedPortFlags held = *now.port;
        if (!flags.locked) held.locked.reset();
        if (flags == held) return;
        RestoreStep step = Step(Action::kSetPortFlags, ns, want.name);
        step.flags = flags;
        steps.push_back(std::move(step));
    });
    each([&](const std::string& ns, const SavedLink& want, const SavedLink& now) {
        if (want.master != now.master) return;
        auto missing = [](const std::vector<Kernel::PortVlan>& from,
                          const std::vector<Kernel::PortVlan>& in) {
            std::vector<Kernel::PortVlan> out;
            for (const auto& vlan : from) {
                if (std::find(in.begin(), in.end(), vlan) == in.end()) out.push_back(vlan);
            }
            return out;
        };
        if (auto extra = missing(now.vlans, want.vlans); !extra.empty()) {
            RestoreStep step = Step(Action::kDeleteVlans, ns, want.name);
            step.vlans = std::move(extra);
            steps.push_back(std::move(step));
        }
        if (auto absent = missing(want.vlans, now.vlans); !absent.empty()) {
            RestoreStep step = Step(Action::kAddVlans, ns, want.name);
            step.vlans = std::move(absent);
            steps.push_back(std::move(step));
        }
        for (const auto& mac : now.staticEntries) {
            if (std::find(want.staticEntries.begin(), want.staticEntries.end(), mac) !=
                want.staticEntries.end())
                continue;
            RestoreStep step = Step(Action::kDeleteStaticEntry, ns, want.name);
            step.value = mac;
            steps.push_back(std::move(step));
        }
        for (const auto& mac : want.staticEntries) {
            if (std::find(now.staticEntries.begin(), now.staticEntries.end(), mac) != now.staticEntries.end())
                continue;
            RestoreStep step = Step(Action::kAddStaticEntry, ns, want.name);
            step.value = mac;
            steps.push_back(std::move(step));
        }
    });
    each([&](const std::string& ns, const SavedLink& want, const SavedLink& now) {
        if (want.bucket == now.bucket) return;
        RestoreStep step = Step(want.bucket ? Action::kSetBucket : Action::kDeleteBucket, ns, want.name);
        step.bucket = want.bucket;
        steps.push_back(std::move(step));
    });
    each([&](const std::string& ns, const SavedLink& want, const SavedLink& now) {
        auto setting = [&](const std::optional<std::string>& value, const std::optional<std::string>& held,
                           const char* name) {
            if (!value || !held || *value == *held) return;
            RestoreStep step = Step(Action::kSetSysctl, ns, "ipv6/conf/" + want.name + "/" + name);
            step.value = *value;
            steps.push_back(std::move(step));
        };
        setting(want.disableIpv6, now.disableIpv6, "disable_ipv6");
        setting(want.acceptRa, now.acceptRa, "accept_ra");
    });
    each([&](const std::string& ns, const SavedLink& want, const SavedLink& now) {
        if (want.up == now.up) return;
        RestoreStep step = Step(Action::kSetUp, ns, want.name);
        step.on = want.up;
        steps.push_back(std::move(step));
    });
}

// The addresses of one device and family, as the kernel lists them.
std::vector<const SavedAddress*> AddressesOf(const SavedNetstack& n, const std::string& device, int family) {
    std::vector<const SavedAddress*> out;
    for (const auto& a : n.addresses) {
        if (a.device == device && a.family == family) out.push_back(&a);
    }
    return out;
}

bool SameList(const std::vector<const SavedAddress*>& a, const std::vector<const SavedAddress*>& b) {
    return a.size() == b.size() && std::equal(a.begin(), a.end(), b.begin(),
                                              [](const auto* x, const auto* y) { return x->Same(*y); });
}

void PlanAddresses(const Snapshot& live, const Snapshot& wanted, std::vector<RestoreStep>& steps) {
    for (const auto& w : wanted.netstacks) {
        const SavedNetstack* n = live.FindNetstack(w.name);
        if (!n) continue;
        for (const auto& link : w.links) {
            if (!n->FindLink(link.name)) continue;
            for (int family : {AF_INET, AF_INET6}) {
                auto want = AddressesOf(w, link.name, family);
                auto now = AddressesOf(*n, link.name, family);
                if (SameList(want, now)) continue;
                auto add = [&](const SavedAddress* a, Action action) {
                    RestoreStep step = Step(action, w.name, link.name);
                    step.address = *a;
                    steps.push_back(std::move(step));
                };
                // When only addresses were added, they go and the others stay as they are.
                std::vector<const SavedAddress*> kept, extra;
                for (const auto* a : now) {
                    bool wanted =
                        std::any_of(want.begin(), want.end(), [&](const auto* b) { return a->Same(*b); });
                    (wanted ? kept : extra).push_back(a);
                }
                if (SameList(kept, want)) {
                    for (auto it = extra.rbegin(); it != extra.rend(); ++it)
                        add(*it, Action::kDeleteAddress);
                    continue;
                }
                // Otherwise the device's addresses are made again in the order the kernel is
                // to list them: an IPv4 address goes after those before it, an IPv6 address
                // before those of its scope (secondaries go before their primary).
                for (auto it = now.rbegin(); it != now.rend(); ++it)
                    add(*it, Action::kDeleteAddress);
                if (family == AF_INET) {
                    for (const auto* a : want)
                        add(a, Action::kAddAddress);
                } else {
                    for (auto it = want.rbegin(); it != want.rend(); ++it)
                        add(*it, Action::kAddAddress);
                }
            }
        }
    }
}

// A route through devices of the snapshot (or none): the host's to restore.
bool OnKnownDevices(const SavedRoute& route, const SavedNetstack& wanted) {
    return std::all_of(route.nexthops.begin(), route.nexthops.end(), [&](const SavedNexthop& hop) {
        return hop.device.empty() || wanted.FindLink(hop.device);
    });
}

void PlanRoutes(const Snapshot& live, const Snapshot& wanted, std::vector<RestoreStep>& steps) {
    for (const auto& w : wanted.netstacks) {
        const SavedNetstack* n = live.FindNetstack(w.name);
        if (!n) continue;
        for (const auto& route : n->routes) {
            if (!OnKnownDevices(route, w)) continue;
            if (std::find(w.routes.begin(), w.routes.end(), route) != w.routes.end()) continue;
            RestoreStep step = Step(Action::kDeleteRoute, w.name);
            step.route = route;
            steps.push_back(std::move(step));
        }
        // Routes to the networks the devices are on before those through gateways on them.
        std::vector<const SavedRoute*> missing;
        for (const auto& route : w.routes) {
            if (std::find(n->routes.begin(), n->routes.end(), route) == n->routes.end())
                missing.push_back(&route);
        }
        std::stable_partition(missing.begin(), missing.end(), [](const SavedRoute* r) {
            return std::none_of(r->nexthops.begin(), r->nexthops.end(),
                                [](const SavedNexthop& hop) { return !hop.gateway.empty(); });
        });
        for (const auto* route : missing) {
            RestoreStep step = Step(Action::kAddRoute, w.name);
            step.route = *route;
            steps.push_back(std::move(step));
        }
        // Permanent neighbours: when only entries were added they go; otherwise the table's
        // entries are made again, the last first, since the kernel lists the newest first.
        for (int family : {AF_INET, AF_INET6}) {
            std::vector<const SavedNeighbour*> now, want, kept, extra;
            for (const auto& neighbour : n->neighbours) {
                if (neighbour.family == family && w.FindLink(neighbour.device)) now.push_back(&neighbour);
            }
            for (const auto& neighbour : w.neighbours) {
                if (neighbour.family == family) want.push_back(&neighbour);
            }
            auto same = [](const std::vector<const SavedNeighbour*>& a,
                           const std::vector<const SavedNeighbour*>& b) {
                return a.size() == b.size() &&
                       std::equal(a.begin(), a.end(), b.begin(),
                                  [](const auto* x, const auto* y) { return *x == *y; });
            };
            if (same(now, want)) continue;
            for (const auto* neighbour : now) {
                bool wanted =
                    std::any_of(want.begin(), want.end(), [&](const auto* b) { return *neighbour == *b; });
                (wanted ? kept : extra).push_back(neighbour);
            }
            auto add = [&](const SavedNeighbour* neighbour, Action action) {
                RestoreStep step = Step(action, w.name, neighbour->device);
                step.neighbour = *neighbour;
                steps.push_back(std::move(step));
            };
            if (same(kept, want)) {
                for (const auto* neighbour : extra)
                    add(neighbour, Action::kDeleteNeighbour);
                continue;
            }
            for (const auto* neighbour : now)
                add(neighbour, Action::kDeleteNeighbour);
            for (auto it = want.rbegin(); it != want.rend(); ++it)
                add(*it, Action::kAddNeighbour);
        }
    }
}

void PlanRest(const Snapshot& live, const Snapshot& wanted, std::vector<RestoreStep>& steps) {
    // /etc/netns, once the netstacks' own directories in it are as they were.
    if (wanted.netstackFiles != live.netstackFiles)
        steps.push_back(
            Step(wanted.netstackFiles ? Action::kMakeFilesDirectory : Action::kRemoveFilesDirectory, {}));
    if (wanted.firewallKnown && live.firewallKnown && wanted.firewall != live.firewall) {
        RestoreStep step = Step(wanted.firewall ? Action::kSetFirewall : Action::kDeleteFirewall, {});
        step.value = wanted.firewall.value_or("");
        steps.push_back(std::move(step));
    }
    for (const auto& policy : live.policies) {
        if (std::find(wanted.policies.begin(), wanted.policies.end(), policy) != wanted.policies.end())
            continue;
        RestoreStep step = Step(Action::kDeletePolicy, {});
        step.policy = policy;
        steps.push_back(std::move(step));
    }
    for (const auto& policy : wanted.policies) {
        if (std::find(live.policies.begin(), live.policies.end(), policy) != live.policies.end()) continue;
        RestoreStep step = Step(Action::kAddPolicy, {});
        step.policy = policy;
        steps.push_back(std::move(step));
    }
    for (const auto& state : live.states) {
        if (std::find(wanted.states.begin(), wanted.states.end(), state) != wanted.states.end()) continue;
        RestoreStep step = Step(Action::kDeleteState, {});
        step.state = state;
        steps.push_back(std::move(step));
    }
    for (const auto& state : wanted.states) {
        if (std::find(live.states.begin(), live.states.end(), state) != live.states.end()) continue;
        RestoreStep step = Step(Action::kCannot, {});
        char spi[16];
        std::snprintf(spi, sizeof(spi), "0x%x", state.spi);
        step.value = std::string("IPsec security association ") + spi + " to " + state.destination +
                     " cannot be made again: the kernel never gives its keys back";
        steps.push_back(std::move(step));
    }
    for (const auto& w : wanted.netstacks) {
        const SavedNetstack* n = live.FindNetstack(w.name);
        if (!n || w.resolvManaged || n->resolvManaged || w.resolvConf == n->resolvConf) continue;
        const std::string path = Kernel::ResolvConfPath(w.name == Context::kDefaultNetstack ? "" : w.name);
        RestoreStep step =
            Step(w.resolvConf ? Action::kWriteResolvConf : Action::kRemoveResolvConf, w.name, path);
        step.value = w.resolvConf.value_or("");
        steps.push_back(std::move(step));
    }
    if (wanted.document != live.document) {
        RestoreStep step = Step(wanted.document ? Action::kWriteDocument : Action::kRemoveDocument, {});
        step.value = wanted.document.value_or("");
        steps.push_back(std::move(step));
    }
}

// ---------------------------------------------------------------- carrying steps out

class Executor {
public:
    explicit Executor(Context& context) : context_(context) {}

    void Apply(const RestoreStep& step) {
        // Netstacks are made and removed by name; every other step works inside one.
        const bool byName =
            step.action == Action::kAddNetstack || step.action == Action::kMakeNetstackFiles ||
            step.action == Action::kRemoveNetstackFiles || step.action == Action::kCannot ||
            step.action == Action::kMakeFilesDirectory || step.action == Action::kRemoveFilesDirectory;
        const Kernel::Namespace ns =
            byName || step.netstack.empty() ? Kernel::Namespace::Own() : context_.NamespaceOf(step.netstack);
        switch (step.action) {
            case Action::kDeleteNetstack: {
                // Its devices first: a veth's other end goes with it at once (the namespace
                // itself goes when the kernel gets round to it).
                for (const auto& link : Kernel::ListBridgeLinks(ns)) {
                    if (!Makeable(link.kind)) continue;
                    try {
                        Kernel::DeleteLink(ns, link.index, link.name);
                    } catch (const HostCtlException&) {
                        // Gone with its other end.
                    }
                }
                Kernel::DeleteNamedNamespace(step.name);
                Kernel::RemoveNamespaceFiles(step.name);
                return;
            }
            case Action::kAddNetstack:
                return Kernel::AddNamedNamespace(step.name);
            case Action::kMakeNetstackFiles:
                if (!Kernel::MakeNamespaceFiles(step.name))
                    throw HostCtlException("cannot make " + std::string(Kernel::kNamespaceFiles) + "/" +
                                           step.name);
                return;
            case Action::kRemoveNetstackFiles:
                if (!Kernel::RemoveNamespaceFiles(step.name))
                    throw HostCtlException(std::string(Kernel::kNamespaceFiles) + "/" + step.name +
                                           " holds files other than resolv.conf");
                return;
            case Action::kMakeFilesDirectory:
                if (mkdir(Kernel::kNamespaceFiles, 0755) != 0 && errno != EEXIST)
                    throw HostCtlException(std::string("cannot make it: ") + std::strerror(errno));
                return;
            case Action::kRemoveFilesDirectory:
                if (rmdir(Kernel::kNamespaceFiles) != 0 && errno != ENOENT)
                    throw HostCtlException(std::string("cannot remove it: ") + std::strerror(errno));
                return;
            case Action::kSetSysctl:
                return Kernel::WriteSysctl(ns, step.name, step.value);
            case Action::kDeleteLink:
                return Kernel::DeleteLink(ns, Index(ns, step.name), step.name);
            case Action::kAddBridge:
                // With the interface index it had (rules may name it), else one of the kernel's.
                try {
                    return Kernel::AddBridge(ns, step.name, step.link->mtu, step.link->index);
                } catch (const HostCtlException&) {
                    if (step.link->index == 0) throw;
                }
                return Kernel::AddBridge(ns, step.name, step.link->mtu);
            case Action::kAddVeth: {
                auto end = [](const SavedLink& link, bool index) {
                    return Kernel::VethEnd{link.name,     link.mac,        link.mtu,
                                           link.rxQueues, link.gsoMaxSize, index ? link.index : 0};
                };
                const auto peerNs = context_.NamespaceOf(step.peerNetstack);
                try {
                    return Kernel::AddVeth(ns, Kernel::VethPair{end(*step.link, true), end(*step.peer, true)},
                                           peerNs);
                } catch (const HostCtlException&) {
                    if (step.link->index == 0) throw;
                }
                return Kernel::AddVeth(ns, Kernel::VethPair{end(*step.link, false), end(*step.peer, false)},
                                       peerNs);
            }
            case Action::kSetMaster: {
                Kernel::LinkChange change;
                change.master = step.value.empty() ? 0 : Index(ns, step.value);
                return Kernel::ChangeLink(ns, step.name, change);
            }
            case Action::kSetMtu: {
                Kernel::LinkChange change;
                change.mtu = step.number;
                return Kernel::ChangeLink(ns, step.name, change);
            }
            case Action::kSetMac: {
                Kernel::LinkChange change;
                change.mac = step.value;
                return Kernel::ChangeLink(ns, step.name, change);
            }
            case Action::kSetUp: {
                Kernel::LinkChange change;
                change.up = step.on;
                return Kernel::ChangeLink(ns, step.name, change);
            }
            case Action::kSetVlanFiltering:
                return Kernel::SetBridgeVlanFiltering(ns, Index(ns, step.name), step.name, step.on);
            case Action::kSetPortFlags: {
                Kernel::PortFlagsChange change;
                change.learning = step.flags->learning;
                change.unicastFlood = step.flags->unicastFlood;
                change.neighSuppress = step.flags->neighSuppress;
                change.locked = step.flags->locked;
                return Kernel::ChangePortFlags(ns, Index(ns, step.name), step.name, change);
            }
            case Action::kAddVlans:
            case Action::kDeleteVlans:
                return Kernel::ChangePortVlans(ns, Index(ns, step.name), step.name, step.vlans,
                                               step.action == Action::kAddVlans);
            case Action::kAddStaticEntry:
            case Action::kDeleteStaticEntry:
                return Kernel::ChangeStaticEntry(ns, Index(ns, step.name), step.name, step.value,
                                                 step.action == Action::kAddStaticEntry);
            case Action::kSetBucket:
                return Kernel::ReplaceTokenBucket(ns, Index(ns, step.name), step.name, *step.bucket);
            case Action::kDeleteBucket:
                return Kernel::DeleteRootQdisc(ns, Index(ns, step.name), step.name);
            case Action::kAddAddress:
            case Action::kDeleteAddress: {
                const SavedAddress& a = *step.address;
                Kernel::Address address;
                address.family = a.family;
                address.index = Index(ns, a.device);
                address.address = a.address;
                address.prefixLength = a.prefixLength;
                address.peer = a.peer;
                address.broadcast = a.broadcast;
                address.label = a.label;
                address.flags = a.flags;
                address.scope = a.scope;
                if (!a.permanent) {
                    address.validLifetime = a.validLifetime;
                    address.preferredLifetime = a.preferredLifetime;
                }
                if (step.action == Action::kAddAddress) return Kernel::AddAddress(ns, address, a.device);
                return Kernel::DeleteAddress(ns, address, a.device);
            }
            case Action::kAddRoute:
            case Action::kDeleteRoute: {
                const SavedRoute& r = *step.route;
                Kernel::Route route;
                route.family = r.family;
                route.destination = r.destination;
                route.prefixLength = r.prefixLength;
                route.table = r.table;
                route.protocol = r.protocol;
                route.type = r.type;
                route.scope = r.scope;
                route.metric = r.metric;
                route.preferredSource = r.preferredSource;
                for (const auto& hop : r.nexthops)
                    route.nexthops.push_back({hop.gateway, hop.device.empty() ? 0 : Index(ns, hop.device)});
                if (step.action == Action::kAddRoute) return Kernel::AddRoute(ns, route);
                return Kernel::DeleteRoute(ns, route);
            }
            case Action::kAddNeighbour:
            case Action::kDeleteNeighbour: {
                const SavedNeighbour& n = *step.neighbour;
                Kernel::Neighbour neighbour;
                neighbour.family = n.family;
                neighbour.index = Index(ns, n.device);
                neighbour.address = n.address;
                neighbour.linkLayer = n.linkLayer;
                neighbour.state = 0x80;  // NUD_PERMANENT
                neighbour.flags = n.flags;
                if (step.action == Action::kAddNeighbour)
                    return Kernel::AddNeighbour(ns, neighbour, n.device);
                return Kernel::DeleteNeighbour(ns, neighbour, n.device);
            }
            case Action::kSetFirewall: {
                // The table goes and comes back as the checkpoint holds it, in one transaction.
                using nlohmann::json;
                json table{{"family", Kernel::kFirewallFamily}, {"name", Kernel::kFirewallTable}};
                json commands =
                    json::array({json{{"add", {{"table", table}}}}, json{{"delete", {{"table", table}}}}});
                json objects = json::parse(step.value, nullptr, false);
                if (!objects.is_array())
                    throw HostCtlException("the checkpoint's firewall table is not JSON");
                for (auto& object : objects)
                    commands.push_back(std::move(object));
                auto result = Kernel::Nftables::Get().Run(json{{"nftables", std::move(commands)}}.dump());
                if (!result.ok)
                    throw HostCtlException("the kernel refused the firewall's table: " + result.error);
                return;
            }
            case Action::kDeleteFirewall:
                return Kernel::DeleteFirewall();
            case Action::kAddPolicy:
            case Action::kDeletePolicy: {
                const SavedPolicy& p = *step.policy;
                Kernel::XfrmPolicy policy;
                policy.selector = p.selector;
                policy.direction = p.direction;
                policy.action = p.action;
                policy.priority = p.priority;
                policy.mainType = p.mainType;
                policy.templates = p.templates;
                if (step.action == Action::kDeletePolicy) {
                    // Deleted by the index the kernel gave it.
                    bool found = false;
                    for (const auto& held : Kernel::ListPolicies(ns)) {
                        if (held.selector == p.selector && held.direction == p.direction &&
                            held.mainType == p.mainType) {
                            policy.index = held.index;
                            found = true;
                            break;
                        }
                    }
                    if (!found) return;
                }
                auto refusal =
                    Kernel::Send(ns, step.action == Action::kAddPolicy ? Kernel::BuildPolicyAdd(policy)
                                                                       : Kernel::BuildPolicyDelete(policy));
                if (refusal)
                    throw HostCtlException(refusal->message.empty() ? std::strerror(refusal->error)
                                                                    : refusal->message);
                return;
            }
            case Action::kDeleteState: {
                Kernel::XfrmState state;
                state.family = step.state->family;
                state.source = step.state->source;
                state.destination = step.state->destination;
                state.spi = step.state->spi;
                state.protocol = step.state->protocol;
                auto refusal = Kernel::Send(ns, Kernel::BuildStateDelete(state));
                if (refusal)
                    throw HostCtlException(refusal->message.empty() ? std::strerror(refusal->error)
                                                                    : refusal->message);
                return;
            }
            case Action::kWriteResolvConf:
                return Kernel::WriteResolvConf(step.name, step.value);
            case Action::kRemoveResolvConf:
                if (unlink(step.name.c_str()) != 0 && errno != ENOENT)
                    throw HostCtlException(std::string("cannot remove it: ") + std::strerror(errno));
                return;
            case Action::kWriteDocument:
                return WriteDocument(step.value);
            case Action::kRemoveDocument:
                if (unlink(context_.GetDocument().Path().c_str()) != 0 && errno != ENOENT)
                    throw HostCtlException(std::string("cannot remove the document: ") +
                                           std::strerror(errno));
                return;
            case Action::kCannot:
                throw HostCtlException(step.value);
        }
    }

private:
    static int Index(const Kernel::Namespace& ns, const std::string& name) {
        auto link = Kernel::FindLink(ns, name);
        if (!link) throw HostCtlException("there is no device " + name);
        return link->index;
    }

    // The document as the checkpoint holds it: through a temporary file, fsync and rename, as
    // the document is written (the caller holds its lock).
    void WriteDocument(const std::string& text) {
        const std::string path = context_.GetDocument().Path();
        const std::string temp = path + ".tmp." + std::to_string(getpid());
        int fd = open(temp.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, 0644);
        if (fd < 0) throw HostCtlException("cannot write " + temp + ": " + std::strerror(errno));
        bool ok = fchmod(fd, 0644) == 0;
        for (std::size_t done = 0; ok && done < text.size();) {
            ssize_t n = write(fd, text.data() + done, text.size() - done);
            if (n < 0 && errno == EINTR) continue;
            ok = n > 0;
            if (ok) done += static_cast<std::size_t>(n);
        }
        ok = ok && fsync(fd) == 0;
        int error = errno;
        ok = close(fd) == 0 && ok;
        if (!ok || rename(temp.c_str(), path.c_str()) != 0) {
            if (ok) error = errno;
            unlink(temp.c_str());
            throw HostCtlException("cannot write " + path + ": " + std::strerror(error));
        }
        auto slash = path.rfind('/');
        const std::string dir = slash == std::string::npos ? "." : slash == 0 ? "/" : path.substr(0, slash);
        if (int dirFd = open(dir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC); dirFd >= 0) {
            fsync(dirFd);
            close(dirFd);
        }
    }

    Context& context_;
};

}  // namespace

std::string RestoreStep::Describe() const {
    const std::string where = Where(netstack);
    switch (action) {
        case Action::kDeleteNetstack:
            return "remove netstack " + name;
        case Action::kAddNetstack:
            return "make netstack " + name;
        case Action::kMakeNetstackFiles:
            return "make " + std::string(Kernel::kNamespaceFiles) + "/" + name;
        case Action::kRemoveNetstackFiles:
            return "remove " + std::string(Kernel::kNamespaceFiles) + "/" + name;
        case Action::kMakeFilesDirectory:
            return "make " + std::string(Kernel::kNamespaceFiles);
        case Action::kRemoveFilesDirectory:
            return "remove " + std::string(Kernel::kNamespaceFiles);
        case Action::kSetSysctl:
            return "set net." + name + " to " + value + where;
        case Action::kDeleteLink:
            return "remove device " + name + where;
        case Action::kAddBridge:
            return "make bridge " + name + where;
        case Action::kAddVeth:
            return "make veth pair " + name + where + " / " + (peer ? peer->name : "") + Where(peerNetstack);
        case Action::kSetMaster:
            return value.empty() ? "take " + name + " out of its bridge" + where
                                 : "make " + name + " a port of " + value + where;
        case Action::kSetMtu:
            return "set the MTU of " + name + " to " + std::to_string(number) + where;
        case Action::kSetMac:
            return "set the MAC address of " + name + " to " + value + where;
        case Action::kSetVlanFiltering:
            return std::string("turn VLAN filtering ") + (on ? "on" : "off") + " on " + name + where;
        case Action::kSetPortFlags:
            return "set the port flags of " + name + where;
        case Action::kAddVlans:
            return "add VLANs to port " + name + where;
        case Action::kDeleteVlans:
            return "remove VLANs from port " + name + where;
        case Action::kAddStaticEntry:
            return "add the static forwarding entry " + value + " on " + name + where;
        case Action::kDeleteStaticEntry:
            return "remove the static forwarding entry " + value + " on " + name + where;
        case Action::kSetBucket:
            return "put the token bucket back on " + name + where;
        case Action::kDeleteBucket:
            return "remove the token bucket of " + name + where;
        case Action::kSetUp:
            return std::string("bring ") + name + (on ? " up" : " down") + where;
        case Action::kDeleteAddress:
            return "remove address " + AddressText(*address) + " from " + address->device + where;
        case Action::kAddAddress:
            return "add address " + AddressText(*address) + " to " + address->device + where;
        case Action::kDeleteRoute:
            return "remove route " + RouteText(*route) + where;
        case Action::kAddRoute:
            return "add route " + RouteText(*route) + where;
        case Action::kDeleteNeighbour:
            return "remove neighbour " + neighbour->address + " on " + neighbour->device + where;
        case Action::kAddNeighbour:
            return "add neighbour " + neighbour->address + " on " + neighbour->device + where;
        case Action::kSetFirewall:
            return "put the firewall's nftables table back";
        case Action::kDeleteFirewall:
            return "remove the firewall's nftables table";
        case Action::kDeletePolicy:
            return "remove " + PolicyText(*policy);
        case Action::kAddPolicy:
            return "add " + PolicyText(*policy);
        case Action::kDeleteState: {
            char spi[16];
            std::snprintf(spi, sizeof(spi), "0x%x", state->spi);
            return std::string("remove IPsec security association ") + spi + " to " + state->destination;
        }
        case Action::kWriteResolvConf:
            return "write " + name;
        case Action::kRemoveResolvConf:
            return "remove " + name;
        case Action::kWriteDocument:
            return "write the host's document";
        case Action::kRemoveDocument:
            return "remove the host's document";
        case Action::kCannot:
            return value;
    }
    return value;
}

std::vector<RestoreStep> PlanRestore(const Snapshot& live, const Snapshot& wanted, RestorePhase phase) {
    std::vector<RestoreStep> steps;
    switch (phase) {
        case RestorePhase::kNetstacks:
            PlanNetstacks(live, wanted, steps);
            break;
        case RestorePhase::kLinks:
            PlanLinks(live, wanted, steps);
            break;
        case RestorePhase::kLinkSettings:
            PlanLinkSettings(live, wanted, steps);
            break;
        case RestorePhase::kAddresses:
            PlanAddresses(live, wanted, steps);
            break;
        case RestorePhase::kRoutes:
            PlanRoutes(live, wanted, steps);
            break;
        case RestorePhase::kRest:
            PlanRest(live, wanted, steps);
            break;
    }
    return steps;
}

std::vector<std::string> Differences(const Snapshot& live, const Snapshot& wanted) {
    std::vector<std::string> out;
    for (auto phase : kRestorePhases) {
        for (const auto& step : PlanRestore(live, wanted, phase))
            out.push_back(step.Describe());
    }
    return out;
}

void Restore(Context& context, const Snapshot& wanted) {
    Executor executor(context);
    std::map<std::string, std::string> refusals;  // a step's description -> the kernel's last word
    for (auto phase : kRestorePhases) {
        // A phase is done when the host holds what it should; what one step does may call for
        // another (a port that joins its bridge takes the bridge's defaults), so it is planned
        // again, a few times at most.
        for (int round = 0; round < 3; ++round) {
            auto steps = PlanRestore(TakeSnapshot(context), wanted, phase);
            std::erase_if(steps, [](const RestoreStep& step) { return step.action == Action::kCannot; });
            if (steps.empty()) break;
            for (const auto& step : steps) {
                try {
                    executor.Apply(step);
                } catch (const HostCtlException& e) {
                    refusals[step.Describe()] = e.what();
                }
            }
        }
    }
    auto left = Differences(TakeSnapshot(context), wanted);
    if (left.empty()) return;
    std::string text;
    constexpr std::size_t kShown = 8;
    for (std::size_t i = 0; i < left.size() && i < kShown; ++i) {
        text += (i ? "; " : "") + left[i];
        if (auto it = refusals.find(left[i]); it != refusals.end()) text += " (" + it->second + ")";
    }
    if (left.size() > kShown) text += "; and " + std::to_string(left.size() - kShown) + " more";
    throw HostCtlException("The host still differs from its checkpoint: " + text);
}

}  // namespace TknCtl::Linux

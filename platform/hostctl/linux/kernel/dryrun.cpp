#include "kernel/dryrun.h"

#include <arpa/inet.h>
#include <linux/if.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <linux/xfrm.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <sys/utsname.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <map>
#include <set>
#include <tuple>

#include "hostctl/session.h"
#include "kernel/describe.h"
#include "kernel/request.h"
#include "kernel/veth.h"

namespace TknCtl::Linux::Kernel {

namespace {

struct State {
    DryRunRecorder record;
    std::vector<LinkPlan> plans;
    int nextIndex = kPlannedIndex;
    std::set<std::string> namespaces;                                    // namespaces the dry run would make
    std::map<std::pair<std::string, std::string>, std::string> sysctls;  // by namespace and name
    std::map<std::string, std::string> files;
    std::optional<std::optional<NftFirewall>> firewall;
    struct Xfrm {
        std::vector<XfrmState> states;  // added
        std::vector<XfrmPolicy> policies;
        std::vector<std::tuple<std::string, std::uint32_t, int>> statesGone;  // destination, SPI, protocol
        std::vector<std::pair<std::uint32_t, int>> policiesGone;              // index, direction
    };
    std::map<std::string, Xfrm> xfrm;  // by namespace
    std::uint32_t nextPolicy = kPlannedIndex;
};

State& Current() {
    static State state;
    return state;
}

std::string MacText(const nlattr* attr) {
    if (!attr || nla_len(attr) != 6) return {};
    const auto* bytes = static_cast<const unsigned char*>(nla_data(attr));
    char text[18];
    std::snprintf(text, sizeof(text), "%02x:%02x:%02x:%02x:%02x:%02x", bytes[0], bytes[1], bytes[2], bytes[3],
                  bytes[4], bytes[5]);
    return text;
}

void Merge(LinkChange& into, const LinkChange& change) {
    if (change.up) into.up = change.up;
    if (change.mtu) into.mtu = change.mtu;
    if (change.mac) into.mac = change.mac;
    if (change.master) into.master = change.master;
}

LinkPlan* PlanOf(const std::string& ns, int index) {
    for (auto& plan : Current().plans) {
        if (plan.ns == ns && plan.index == index) return &plan;
    }
    return nullptr;
}

LinkPlan& PlanFor(const std::string& ns, int index) {
    if (auto* plan = PlanOf(ns, index)) return *plan;
    LinkPlan plan;
    plan.ns = ns;
    plan.index = index;
    Current().plans.push_back(plan);
    return Current().plans.back();
}

// Whether the kernel knows locked bridge ports (5.18 and later), for a port a dry run makes
// where no other port says.
bool KernelKnowsLockedPorts() {
    utsname name{};
    int major = 0, minor = 0;
    if (uname(&name) != 0 || std::sscanf(name.release, "%d.%d", &major, &minor) != 2) return false;
    return major > 5 || (major == 5 && minor >= 18);
}

bool IsGone(const std::vector<LinkPlan>& plans, const std::string& ns, int index) {
    return std::any_of(plans.begin(), plans.end(),
                       [&](const LinkPlan& p) { return p.ns == ns && p.index == index && p.gone; });
}

// A link as the kernel reports a fresh device of its kind, with what later requests changed.
Link MadeLink(const LinkPlan& plan) {
    Link link;
    link.index = plan.index;
    link.name = plan.name;
    link.kind = plan.kind;
    link.mac = plan.change.mac.value_or(plan.mac);
    link.broadcast = "ff:ff:ff:ff:ff:ff";
    link.mtu = plan.change.mtu.value_or(plan.mtu ? plan.mtu : 1500);
    link.up = plan.change.up.value_or(false);
    link.flags = IFF_BROADCAST | IFF_MULTICAST | (link.up ? IFF_UP : 0);
    link.operState = "down";
    link.master = plan.change.master.value_or(0);
    link.peer = plan.peer;
    link.txQueueLength = 1000;
    link.numTxQueues = 1;
    link.numRxQueues = plan.rxQueues ? plan.rxQueues : 1;
    link.gsoMaxSize = plan.gsoMaxSize ? plan.gsoMaxSize : 65536;
    link.ipv6 = Link::Ipv6Settings{false, 1, false};
    return link;
}

void ChangeIpv6(Link& link, const LinkPlan& plan) {
    if (!plan.ipv6Disabled && !plan.acceptRa) return;
    if (!link.ipv6) link.ipv6 = Link::Ipv6Settings{false, 1, false};
    if (plan.ipv6Disabled) link.ipv6->disabled = *plan.ipv6Disabled;
    if (plan.acceptRa) link.ipv6->acceptRa = *plan.acceptRa;
}

void Change(Link& link, const LinkChange& change) {
    if (change.up) {
        link.up = *change.up;
        link.flags = *change.up ? (link.flags | IFF_UP) : (link.flags & ~static_cast<unsigned>(IFF_UP));
    }
    if (change.mtu) link.mtu = *change.mtu;
    if (change.mac) link.mac = *change.mac;
    if (change.master) link.master = *change.master;
}

}  // namespace

void SetDryRun(DryRunRecorder record) {
    auto& state = Current();
    state = State{};
    state.record = std::move(record);
}

bool DryRun() {
    return static_cast<bool>(Current().record);
}

std::string NetstackName(const Namespace& ns) {
    return ns.IsOwn() ? std::string(kOwnNetstack) : ns.Name();
}

void Record(const std::string& what, const Namespace& ns) {
    Record(what + " (netstack " + NetstackName(ns) + ")");
}

void Record(const std::string& what) {
    if (auto& record = Current().record) record("kernel: " + what, false);
}

void StopDryRun(const std::string& next) {
    if (auto& record = Current().record) record("dry run ends here: the real run would next " + next, true);
    throw HostCtl::Lib::DryRunEnd("the real run would next " + next);
}

// ---------------------------------------------------------------- plans of links

const std::vector<LinkPlan>& LinkPlans() {
    return Current().plans;
}

const LinkPlan* FindLinkPlan(const Namespace& ns, int index) {
    return PlanOf(ns.Name(), index);
}

void ApplyLinkPlans(const std::vector<LinkPlan>& plans, const std::string& ns, std::vector<Link>& links) {
    std::erase_if(links, [&](const Link& link) { return IsGone(plans, ns, link.index); });
    for (auto& link : links) {
        for (const auto& plan : plans) {
            if (plan.ns != ns || plan.index != link.index || plan.made) continue;
            Change(link, plan.change);
            ChangeIpv6(link, plan);
        }
        // A bridge deleted lets its ports go.
        if (link.master != 0 && IsGone(plans, ns, link.master)) link.master = 0;
    }
    for (const auto& plan : plans) {
        if (plan.ns != ns || !plan.made || plan.gone) continue;
        Link link = MadeLink(plan);
        ChangeIpv6(link, plan);
        if (link.master != 0 && IsGone(plans, ns, link.master)) link.master = 0;
        links.push_back(std::move(link));
    }
    std::stable_sort(links.begin(), links.end(),
                     [](const Link& a, const Link& b) { return a.index < b.index; });
}

void ApplyLinkPlans(const std::vector<LinkPlan>& plans, const std::string& ns,
                    std::vector<BridgeLink>& links) {
    // What the kernel's own bridges and ports say of what it has, for those a dry run makes.
    std::optional<bool> vlanFilteringAvailable;
    std::optional<bool> hasLocked;
    for (const auto& link : links) {
        if (link.bridge) vlanFilteringAvailable = link.bridge->vlanFilteringAvailable;
        if (link.port) hasLocked = link.port->hasLocked;
    }
    std::erase_if(links, [&](const BridgeLink& link) { return IsGone(plans, ns, link.index); });
    for (const auto& plan : plans) {
        if (plan.ns != ns || !plan.made || plan.gone) continue;
        const Link made = MadeLink(plan);
        BridgeLink link;
        link.index = made.index;
        link.name = made.name;
        link.kind = made.kind;
        link.mac = made.mac;
        link.mtu = made.mtu;
        link.up = made.up;
        link.peer = plan.peer;
        if (plan.peer != 0 && plan.peerNs != ns) link.peerNamespaceId = -1;
        if (plan.kind == "bridge")
            link.bridge = BridgeInfo{vlanFilteringAvailable.value_or(false), false, 1, false};
        links.push_back(std::move(link));
    }
    auto isBridge = [&](int index) {
        return std::any_of(links.begin(), links.end(),
                           [&](const BridgeLink& l) { return l.index == index && l.bridge.has_value(); });
    };
    for (auto& link : links) {
        const LinkPlan* plan = nullptr;
        for (const auto& p : plans) {
            if (p.ns == ns && p.index == link.index) plan = &p;
        }
        std::optional<int> master;
        if (plan && plan->change.up) link.up = *plan->change.up;
        if (plan && plan->change.mtu) link.mtu = *plan->change.mtu;
        if (plan && plan->change.mac && !plan->made) link.mac = *plan->change.mac;
        if (plan && plan->change.master) master = plan->change.master;
        if (link.master != 0 && IsGone(plans, ns, link.master)) master = 0;
        if (!master) continue;
        link.master = *master;
        if (*master != 0 && isBridge(*master)) {
            link.masterKind = "bridge";
            if (!link.port) {
                PortInfo port;
                port.state = kPortForwarding;
                port.hasLocked = hasLocked.value_or(KernelKnowsLockedPorts());
                link.port = port;
            }
        } else {
            link.masterKind.clear();
            link.port.reset();
        }
    }
    std::stable_sort(links.begin(), links.end(),
                     [](const BridgeLink& a, const BridgeLink& b) { return a.index < b.index; });
}

std::optional<Link> ApplyLinkPlans(const std::vector<LinkPlan>& plans, const std::string& ns,
                                   const std::string& name, std::optional<Link> found) {
    std::vector<Link> links;
    if (found) links.push_back(std::move(*found));
    ApplyLinkPlans(plans, ns, links);
    for (auto& link : links) {
        if (link.name == name) return std::move(link);
    }
    return std::nullopt;
}

void PlanVeth(const Namespace& ns, const VethPair& pair, const Namespace& peerNs) {
    auto& state = Current();
    LinkPlan end;
    end.ns = ns.Name();
    end.made = true;
    end.kind = "veth";
    end.index = state.nextIndex++;
    LinkPlan peer = end;
    peer.ns = peerNs.Name();
    peer.index = state.nextIndex++;
    auto fill = [](LinkPlan& plan, const VethEnd& values) {
        plan.name = values.name;
        plan.mac = values.mac;
        plan.mtu = values.mtu;
        plan.rxQueues = values.rxQueues;
        plan.gsoMaxSize = values.gsoMaxSize;
    };
    fill(end, pair.end);
    fill(peer, pair.peer);
    end.peer = peer.index;
    end.peerNs = peer.ns;
    peer.peer = end.index;
    peer.peerNs = end.ns;
    state.plans.push_back(std::move(end));
    state.plans.push_back(std::move(peer));
}

void PlanLinkRequest(const Namespace& ns, const nlmsghdr* request) {
    auto* header = const_cast<nlmsghdr*>(request);
    const int type = header->nlmsg_type;
    if ((type != RTM_NEWLINK && type != RTM_SETLINK && type != RTM_DELLINK) ||
        !nlmsg_valid_hdr(header, sizeof(ifinfomsg)))
        return;
    const auto* info = static_cast<const ifinfomsg*>(nlmsg_data(header));
    if (info->ifi_family == AF_BRIDGE) return;  // a port's flags or VLANs: no attribute of the link
    nlattr* tb[IFLA_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(ifinfomsg), tb, IFLA_MAX, nullptr) < 0) return;
    auto& state = Current();
    if (type == RTM_DELLINK) {
        auto& plan = PlanFor(ns.Name(), info->ifi_index);
        plan.gone = true;
        // Either end of a veth pair made takes the other with it.
        if (plan.made && plan.peer != 0) {
            const std::string peerNs = plan.peerNs;
            const int peer = plan.peer;
            PlanFor(peerNs, peer).gone = true;
        }
        return;
    }
    LinkChange change;
    if (info->ifi_change & IFF_UP) change.up = (info->ifi_flags & IFF_UP) != 0;
    if (tb[IFLA_MTU]) change.mtu = nla_get_u32(tb[IFLA_MTU]);
    if (auto mac = MacText(tb[IFLA_ADDRESS]); !mac.empty()) change.mac = mac;
    if (tb[IFLA_MASTER]) change.master = static_cast<int>(nla_get_u32(tb[IFLA_MASTER]));
    if (header->nlmsg_flags & NLM_F_CREATE) {
        LinkPlan plan;
        plan.ns = ns.Name();
        plan.made = true;
        plan.index = state.nextIndex++;
        if (tb[IFLA_IFNAME]) {
            const char* text = static_cast<const char*>(nla_data(tb[IFLA_IFNAME]));
            plan.name.assign(text, strnlen(text, static_cast<std::size_t>(nla_len(tb[IFLA_IFNAME]))));
        }
        nlattr* linkinfo[IFLA_INFO_MAX + 1] = {};
        if (tb[IFLA_LINKINFO] && nla_parse_nested(linkinfo, IFLA_INFO_MAX, tb[IFLA_LINKINFO], nullptr) >= 0 &&
            linkinfo[IFLA_INFO_KIND]) {
            const char* text = static_cast<const char*>(nla_data(linkinfo[IFLA_INFO_KIND]));
            plan.kind.assign(text,
                             strnlen(text, static_cast<std::size_t>(nla_len(linkinfo[IFLA_INFO_KIND]))));
        }
        plan.mtu = change.mtu.value_or(0);
        plan.mac = change.mac.value_or("");
        change.mtu.reset();
        change.mac.reset();
        plan.change = change;
        state.plans.push_back(std::move(plan));
        return;
    }
    if (info->ifi_index == 0) return;
    Merge(PlanFor(ns.Name(), info->ifi_index).change, change);
}

// ---------------------------------------------------------------- namespaces

bool IsPlannedNamespace(const Namespace& ns) {
    return !ns.IsOwn() && IsPlannedNamespace(ns.Name());
}

bool IsPlannedNamespace(const std::string& name) {
    return DryRun() && Current().namespaces.count(name) != 0;
}

std::vector<std::string> PlannedNamespaces() {
    const auto& names = Current().namespaces;
    return {names.begin(), names.end()};
}

void PlanNamespace(const std::string& name, bool made) {
    if (made) {
        Current().namespaces.insert(name);
    } else {
        Current().namespaces.erase(name);
    }
}

void PlanSysctl(const Namespace& ns, const std::string& name, const std::string& value) {
    Current().sysctls[{ns.Name(), name}] = value;
    // ipv6/conf/DEVICE/SETTING: the device's link says it too.
    const std::string prefix = "ipv6/conf/";
    if (name.rfind(prefix, 0) != 0) return;
    const auto slash = name.find('/', prefix.size());
    if (slash == std::string::npos) return;
    const std::string device = name.substr(prefix.size(), slash - prefix.size());
    const std::string setting = name.substr(slash + 1);
    if (device == "all" || device == "default" || (setting != "disable_ipv6" && setting != "accept_ra"))
        return;
    auto link = FindLink(ns, device);
    if (!link) return;
    auto& plan = PlanFor(ns.Name(), link->index);
    if (setting == "disable_ipv6") {
        plan.ipv6Disabled = value != "0";
    } else {
        int ra = 0;
        if (std::sscanf(value.c_str(), "%d", &ra) == 1) plan.acceptRa = ra;
    }
}

std::optional<std::string> PlannedSysctl(const Namespace& ns, const std::string& name) {
    const auto& sysctls = Current().sysctls;
    auto it = sysctls.find({ns.Name(), name});
    if (it == sysctls.end()) return std::nullopt;
    return it->second;
}

void PlanFile(const std::string& path, const std::string& text) {
    Current().files[path] = text;
}

std::optional<std::string> PlannedFile(const std::string& path) {
    const auto& files = Current().files;
    auto it = files.find(path);
    if (it == files.end()) return std::nullopt;
    return it->second;
}

void PlanFirewall(std::optional<NftFirewall> firewall) {
    Current().firewall = std::move(firewall);
}

const std::optional<std::optional<NftFirewall>>& PlannedFirewall() {
    return Current().firewall;
}

void PlanXfrmRequest(const Namespace& ns, nl_msg* request) {
    auto& xfrm = Current().xfrm[ns.Name()];
    nlmsghdr* header = nlmsg_hdr(request);
    switch (header->nlmsg_type) {
        case XFRM_MSG_NEWSA:
            if (auto state = ParseState(request)) xfrm.states.push_back(std::move(*state));
            break;
        case XFRM_MSG_NEWPOLICY:
            if (auto policy = ParsePolicy(request)) {
                policy->index = Current().nextPolicy++;
                xfrm.policies.push_back(std::move(*policy));
            }
            break;
        case XFRM_MSG_DELSA: {
            if (!nlmsg_valid_hdr(header, sizeof(xfrm_usersa_id))) break;
            const auto* id = static_cast<const xfrm_usersa_id*>(nlmsg_data(header));
            char text[INET6_ADDRSTRLEN] = {};
            if (!inet_ntop(id->family, &id->daddr, text, sizeof(text))) break;
            xfrm.statesGone.emplace_back(text, ntohl(id->spi), id->proto);
            break;
        }
        case XFRM_MSG_DELPOLICY: {
            if (!nlmsg_valid_hdr(header, sizeof(xfrm_userpolicy_id))) break;
            const auto* id = static_cast<const xfrm_userpolicy_id*>(nlmsg_data(header));
            xfrm.policiesGone.emplace_back(id->index, id->dir);
            break;
        }
        default:
            break;
    }
}

void ApplyXfrmPlans(const Namespace& ns, std::vector<XfrmState>& states) {
    auto it = Current().xfrm.find(ns.Name());
    if (it == Current().xfrm.end()) return;
    const auto& xfrm = it->second;
    states.insert(states.end(), xfrm.states.begin(), xfrm.states.end());
    std::erase_if(states, [&](const XfrmState& s) {
        return std::find(xfrm.statesGone.begin(), xfrm.statesGone.end(),
                         std::make_tuple(s.destination, s.spi, s.protocol)) != xfrm.statesGone.end();
    });
}

void ApplyXfrmPlans(const Namespace& ns, std::vector<XfrmPolicy>& policies) {
    auto it = Current().xfrm.find(ns.Name());
    if (it == Current().xfrm.end()) return;
    const auto& xfrm = it->second;
    policies.insert(policies.end(), xfrm.policies.begin(), xfrm.policies.end());
    std::erase_if(policies, [&](const XfrmPolicy& p) {
        return std::find(xfrm.policiesGone.begin(), xfrm.policiesGone.end(),
                         std::make_pair(p.index, p.direction)) != xfrm.policiesGone.end();
    });
}

void RehearseRequest(const Namespace& ns, const nlmsghdr* request) {
    // The devices' names, read once for the line (the request refers to them by index).
    std::optional<std::vector<Link>> links;
    auto names = [&](int index) {
        for (const auto& plan : Current().plans) {
            if (plan.ns == ns.Name() && plan.index == index && plan.made) return plan.name;
        }
        if (!links) links = IsPlannedNamespace(ns) ? std::vector<Link>() : ListLinks(ns, false);
        for (const auto& link : *links) {
            if (link.index == index) return link.name;
        }
        return "#" + std::to_string(index);
    };
    std::string what = DescribeRouteRequest(request, names);
    if (what.empty()) what = "rtnetlink request of type " + std::to_string(request->nlmsg_type);
    PlanLinkRequest(ns, request);
    Record(what, ns);
    // What was read of the kernel before is read again, with the plans.
    Changed();
}

}  // namespace TknCtl::Linux::Kernel

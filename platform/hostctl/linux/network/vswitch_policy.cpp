// The policies of the Linux host's switches and port groups in kernel terms: port flags and
// static forwarding entries (security), root token buckets (shaping), and the one active
// uplink a bridge can have without the bonding driver (teaming). network/vswitch.h says how.
#include <algorithm>
#include <map>

#include "core/context.h"
#include "hostctl/exception.h"
#include "kernel/links.h"
#include "network/vswitch.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;
namespace Net = HostCtl::Network;

namespace {

// A frame of a port: its MTU with the Ethernet header, and with a VLAN tag besides.
constexpr unsigned kEthernetHeader = 14;
constexpr unsigned kVlanTag = 4;

std::string Kbps(std::uint64_t bps) {
    return std::to_string(bps / 1000) + " Kbps";
}

std::string Kib(std::uint64_t bytes) {
    return std::to_string(bytes / 128) + " Kib";
}

std::string BondingText(bool bonding) {
    return bonding ? "which the Linux host does not use yet"
                   : "which this kernel does not have (CONFIG_BONDING)";
}

// The burst a kernel reads back for one asked: the bucket goes through microseconds and ticks
// of 64 ns on its way, so it may come back off by a couple of microseconds' worth of bytes.
bool SameBurst(std::uint32_t asked, std::uint32_t got, std::uint32_t rate) {
    const std::uint64_t slack = 2ull * rate / 1000000 + 16;
    return (asked > got ? asked - got : got - asked) <= slack;
}

bool SameBucket(const Kernel::TokenBucket& asked, const Kernel::TokenBucket& got) {
    return asked.rate == got.rate && asked.peakRate == got.peakRate &&
           SameBurst(asked.burst, got.burst, asked.rate) &&
           (asked.peakRate == 0 || SameBurst(asked.peakBucket, got.peakBucket, asked.peakRate));
}

}  // namespace

// ---------------------------------------------------------------- plain rules

Net::PortSecurityPolicy Overlay(const Net::PortSecurityPolicy& base, const Net::PortSecurityPolicy& over) {
    Net::PortSecurityPolicy out = base;
    if (over.IsAllowPromiscuousSet()) out.SetAllowPromiscuous(over.GetAllowPromiscuous());
    if (over.IsAllowMacAddressChangeSet()) out.SetAllowMacAddressChange(over.GetAllowMacAddressChange());
    if (over.IsAllowForgedTransmitsSet()) out.SetAllowForgedTransmits(over.GetAllowForgedTransmits());
    return out;
}

Net::ShapingPolicy Overlay(const Net::ShapingPolicy& base, const Net::ShapingPolicy& over) {
    Net::ShapingPolicy out = base;
    if (over.IsEnabledSet()) out.SetEnabled(over.IsEnabled());
    if (over.IsAverageBpsSet()) out.SetAverageBps(over.GetAverageBps());
    if (over.IsPeakBpsSet()) out.SetPeakBps(over.GetPeakBps());
    if (over.IsBurstSizeSet()) out.SetBurstSize(over.GetBurstSize());
    return out;
}

Net::NicTeamingPolicy Overlay(const Net::NicTeamingPolicy& base, const Net::NicTeamingPolicy& over) {
    Net::NicTeamingPolicy out = base;
    if (over.IsTeamingPolicySet()) out.SetTeamingPolicy(over.GetTeamingPolicy());
    if (over.IsNotifySwitchOnFailureSet()) out.SetNotifySwitchOnFailure(over.GetNotifySwitchOnFailure());
    if (over.IsRollingRestorationSet()) out.SetRollingRestoration(over.GetRollingRestoration());
    if (over.IsLinkCriteriaSet()) out.SetLinkCriteria(over.GetLinkCriteria());
    if (over.IsUplinkOrderSet()) out.SetUplinkOrder(over.GetUplinkOrder());
    if (over.IsMaxActiveUplinksSet()) out.SetMaxActiveUplinks(over.GetMaxActiveUplinks());
    return out;
}

std::string SecurityRefusal(const Net::PortSecurityPolicy& policy) {
    if (policy.GetAllowPromiscuous()) {
        return "promiscuous mode cannot be allowed on a Linux bridge: it gives a port the frames addressed "
               "to "
               "the port and those it floods, never the frames it forwards to other ports";
    }
    return {};
}

PortSecurityFlags SecurityFlags(const Net::PortSecurityPolicy& policy) {
    PortSecurityFlags out;
    out.flags.unicastFlood = policy.GetAllowPromiscuous();
    out.flags.learning = policy.GetAllowMacAddressChange();
    out.flags.locked = !policy.GetAllowForgedTransmits();
    out.needsClientMac = !*out.flags.learning || *out.flags.locked;
    return out;
}

std::optional<Kernel::TokenBucket> ShapingBucket(const Net::ShapingPolicy& policy, unsigned mtu,
                                                 std::string& refusal) {
    if (!policy.IsAverageBpsSet() || !policy.IsPeakBpsSet() || !policy.IsBurstSizeSet()) {
        refusal = "shaping needs an average bandwidth, a peak bandwidth and a burst size";
        return std::nullopt;
    }
    const std::uint64_t average = policy.GetAverageBps(), peak = policy.GetPeakBps(),
                        burst = policy.GetBurstSize();
    const std::uint64_t most = std::uint64_t{Kernel::kMaxBucketRate} * 8;
    if (average == 0 || average / 8 == 0) {
        refusal = "an average bandwidth of " + Kbps(average) + " sends nothing";
    } else if (average > most || peak > most) {
        refusal = "a token bucket of this host takes bandwidths up to " + Kbps(most) + ", not " +
                  Kbps(std::max(average, peak));
    } else if (peak < average) {
        refusal = "the peak bandwidth (" + Kbps(peak) + ") is below the average bandwidth (" + Kbps(average) +
                  "): a token bucket's peak rate cannot be below its average rate";
    } else if (burst > UINT32_MAX) {
        refusal = "a token bucket holds bursts up to " + Kib(UINT32_MAX) + ", not " + Kib(burst);
    } else if (burst / (average / 8) >= Kernel::kMaxBurstSeconds) {
        refusal = "a burst of " + Kib(burst) + " lasts " + std::to_string(burst / (average / 8)) +
                  " seconds at the average bandwidth of " + Kbps(average) +
                  "; a token bucket holds at most " + std::to_string(Kernel::kMaxBurstSeconds) +
                  " seconds of it";
    } else if (burst < mtu + kEthernetHeader) {
        refusal = "a burst of " + std::to_string(burst) + " bytes cannot pass a full frame of " +
                  std::to_string(mtu + kEthernetHeader) + " bytes (MTU " + std::to_string(mtu) +
                  "): every such frame would be dropped";
    }
    if (!refusal.empty()) return std::nullopt;
    Kernel::TokenBucket bucket;
    bucket.rate = static_cast<std::uint32_t>(average / 8);
    bucket.burst = static_cast<std::uint32_t>(burst);
    // A peak equal to the average adds nothing to the bucket.
    if (peak > average) {
        bucket.peakRate = static_cast<std::uint32_t>(peak / 8);
        bucket.peakBucket = mtu + kEthernetHeader + kVlanTag;
    }
    // What may wait for tokens: the burst and 50 ms at the average rate.
    bucket.limit = static_cast<std::uint32_t>(std::min<std::uint64_t>(burst + bucket.rate / 20, UINT32_MAX));
    return bucket;
}

std::string TeamingRefusal(const Net::NicTeamingPolicy& policy, const std::vector<std::string>& uplinks,
                           bool bonding) {
    const auto& criteria = policy.GetLinkCriteria();
    if (policy.IsLinkCriteriaSet() && criteria.IsBeaconSet() && !criteria.GetBeacon()) {
        return "beacon probing is not available on a Linux host: a bridge knows an uplink's failure by its "
               "link "
               "state only";
    }
    if (uplinks.size() > 1) {
        return "a bridge forwards on every uplink it has, and more than one needs the bonding driver, " +
               BondingText(bonding);
    }
    const auto& order = policy.IsUplinkOrderSet() ? policy.GetUplinkOrder() : uplinks;
    const auto active = static_cast<std::size_t>(std::clamp<long>(
        policy.IsMaxActiveUplinksSet() ? policy.GetMaxActiveUplinks() : static_cast<long>(order.size()), 0,
        static_cast<long>(order.size())));
    for (const auto& uplink : uplinks) {
        auto at = std::find(order.begin(), order.end(), uplink);
        if (at != order.end() && static_cast<std::size_t>(at - order.begin()) < active) continue;
        return "uplink " + uplink + " would be " + (at == order.end() ? "unused" : "standby") +
               ", but a bridge forwards on every uplink it has: keeping one out of service needs the bonding "
               "driver, " +
               BondingText(bonding);
    }
    return {};
}

std::vector<Kernel::PortVlan> PortGroupVlans(std::uint16_t vlanId, std::uint16_t defaultPvid) {
    if (vlanId == 0) return {{defaultPvid, 0, true, true}};
    if (vlanId < Net::PortGroup::MAX_VLAN_ID) return {{vlanId, 0, true, true}};
    // Every VLAN: tagged as the client tags them, untagged frames in the bridge's own VLAN.
    return {{1, Net::PortGroup::MAX_VLAN_ID - 1, false, false}, {defaultPvid, 0, true, true}};
}

std::vector<Kernel::PortVlan> UplinkVlans(const std::vector<std::uint16_t>& vlanIds,
                                          std::uint16_t defaultPvid) {
    std::vector<Kernel::PortVlan> vlans;
    std::vector<std::uint16_t> ids = vlanIds;
    std::sort(ids.begin(), ids.end());
    ids.erase(std::unique(ids.begin(), ids.end()), ids.end());
    if (!ids.empty() && ids.back() == Net::PortGroup::MAX_VLAN_ID) {
        vlans.push_back({1, Net::PortGroup::MAX_VLAN_ID - 1, false, false});
    } else {
        for (auto id : ids) {
            if (id != 0 && id != defaultPvid) vlans.push_back({id, 0, false, false});
        }
    }
    // Frames of the port groups without a VLAN leave untagged, in the bridge's own VLAN.
    vlans.push_back({defaultPvid, 0, true, true});
    return vlans;
}

// ---------------------------------------------------------------- carrying policies out

const PortGroupRecord* LinuxSwitches::GroupOfPort(const SwitchRecord& record, const std::string& port) {
    for (const auto& group : record.portGroups) {
        if (std::find(group.ports.begin(), group.ports.end(), port) != group.ports.end()) return &group;
    }
    return nullptr;
}

std::optional<std::string> LinuxSwitches::ClientMac(const View& view, const Kernel::BridgeLink& port) const {
    if (port.kind != "veth" || port.peer == 0) return std::nullopt;
    // An end a dry run would make: its peer's address is the one asked for, else the kernel's
    // choice, which only the real run learns.
    if (const auto* plan = Kernel::FindLinkPlan(Kernel::Namespace::Own(), port.index); plan && plan->made) {
        for (const auto& peer : Kernel::LinkPlans()) {
            if (peer.ns != plan->peerNs || peer.index != plan->peer) continue;
            if (!peer.mac.empty()) return peer.mac;
            Kernel::StopDryRun("read the MAC address the kernel gives " + peer.name +
                               " and carry out the security policy on " + port.name +
                               " with it (a static forwarding entry of that address, then the port flags)");
        }
    }
    if (!port.peerNamespaceId) {
        const auto* peer = view.ByIndex(port.peer);
        return peer && !peer->mac.empty() ? std::optional<std::string>(peer->mac) : std::nullopt;
    }
    // The peer lies in another netstack: the one the kernel knows under that ID.
    const auto own = Kernel::Namespace::Own();
    for (const auto& netstack : context_.Netstacks()) {
        if (netstack == Context::kDefaultNetstack) continue;
        const auto ns = Kernel::Namespace::Named(netstack);
        if (Kernel::NamespaceId(own, ns) != port.peerNamespaceId) continue;
        for (const auto& link : Kernel::ListBridgeLinks(ns)) {
            if (link.index == port.peer && !link.mac.empty()) return link.mac;
        }
    }
    return std::nullopt;
}

void LinuxSwitches::ApplySecurity(const View& view, const Kernel::BridgeLink& bridge,
                                  const SwitchRecord& record, const std::string& only) {
    struct Plan {
        const Kernel::BridgeLink* port;
        PortSecurityFlags want;
        Kernel::PortFlagsChange change;  // what differs from what the port has
        std::optional<std::string> mac;
    };
    std::vector<Plan> plans;
    // Every port is judged before any is changed: a refusal changes nothing.
    for (const auto* port : view.PortsOf(bridge)) {
        if (IsNic(*port) || (!only.empty() && port->name != only)) continue;
        const auto* group = GroupOfPort(record, port->name);
        const auto policy =
            group ? Overlay(record.policy.security, group->policy.security) : record.policy.security;
        const std::string refused = "Unable to carry out the security policy of " +
                                    (group ? "port group " + group->name : "virtual switch " + bridge.name) +
                                    " on port " + port->name + ": ";
        if (auto why = SecurityRefusal(policy); !why.empty()) throw HostCtlException(refused + why);
        const auto want = SecurityFlags(policy);
        if (*want.flags.locked && !port->port->hasLocked) {
            throw HostCtlException(
                refused +
                "refusing forged transmits needs locked bridge ports, which this kernel does not "
                "have (Linux 5.18 and later)");
        }
        Plan plan{port, want, {}, std::nullopt};
        if (want.needsClientMac) {
            plan.mac = ClientMac(view, *port);
            if (!plan.mac) {
                throw HostCtlException(refused +
                                       "it is no interface's veth end, so the address of its client is "
                                       "unknown to the host: refusing MAC changes or forged transmits "
                                       "needs it");
            }
        }
        const auto& now = *port->port;
        if (now.learning != *want.flags.learning) plan.change.learning = want.flags.learning;
        if (now.unicastFlood != *want.flags.unicastFlood) plan.change.unicastFlood = want.flags.unicastFlood;
        if (*want.flags.locked != now.locked) plan.change.locked = want.flags.locked;
        plans.push_back(std::move(plan));
    }
    if (plans.empty()) return;
    const auto own = Kernel::Namespace::Own();
    // The client's address first, so that locking the port never cuts the client off.
    for (const auto& plan : plans) {
        if (plan.mac) Kernel::ChangeStaticEntry(own, plan.port->index, plan.port->name, *plan.mac, true);
        Kernel::ChangePortFlags(own, plan.port->index, plan.port->name, plan.change);
    }
    if (Kernel::DryRun()) return;  // nothing changed to read back
    const auto after = Look();
    const auto entries = Kernel::ListForwardingEntries(own);
    for (const auto& plan : plans) {
        const auto* port = after.Find(plan.port->name);
        const auto& want = plan.want;
        bool same = port && port->port && port->port->learning == *want.flags.learning &&
                    port->port->unicastFlood == *want.flags.unicastFlood &&
                    (!port->port->hasLocked || port->port->locked == *want.flags.locked);
        if (same && plan.mac) {
            same = std::any_of(entries.begin(), entries.end(), [&](const Kernel::ForwardingEntry& entry) {
                return entry.port == port->index && entry.mac == *plan.mac && entry.isStatic;
            });
        }
        if (!same) {
            throw HostCtlException("The bridge port flags of " + plan.port->name +
                                   " are not those of the security policy after it was carried out");
        }
    }
}

void LinuxSwitches::ApplyShaping(const View& view, const Kernel::BridgeLink& bridge,
                                 const SwitchRecord& record, const std::string& only) {
    const auto own = Kernel::Namespace::Own();
    const auto roots = Kernel::ListRootQdiscs(own);
    auto rootOf = [&](int link) -> const Kernel::RootQdisc* {
        for (const auto& root : roots) {
            if (root.link == link) return &root;
        }
        return nullptr;
    };
    struct Plan {
        const Kernel::BridgeLink* port;
        std::optional<Kernel::TokenBucket> bucket;  // nothing: the port's token bucket goes
    };
    std::vector<Plan> plans;
    for (const auto* port : view.PortsOf(bridge)) {
        if (!only.empty() && port->name != only) continue;
        const auto* group = IsNic(*port) ? nullptr : GroupOfPort(record, port->name);
        const auto policy =
            group ? Overlay(record.policy.shaping, group->policy.shaping) : record.policy.shaping;
        const auto* root = rootOf(port->index);
        if (!policy.IsEnabled()) {
            if (root && root->kind == "tbf") plans.push_back({port, std::nullopt});
            continue;
        }
        const std::string refused = "Unable to shape the traffic of port " + port->name + " of " +
                                    (group ? "port group " + group->name : "virtual switch " + bridge.name) +
                                    ": ";
        std::string why;
        auto bucket = ShapingBucket(policy, port->mtu, why);
        if (!bucket) throw HostCtlException(refused + why);
        if (root && root->handle != 0 && root->kind != "tbf") {
            throw HostCtlException(refused + "it has a queueing discipline of its own (" + root->kind +
                                   "); remove it first");
        }
        if (root && root->bucket && SameBucket(*bucket, *root->bucket)) continue;
        plans.push_back({port, bucket});
    }
    for (const auto& plan : plans) {
        if (plan.bucket) {
            Kernel::ReplaceTokenBucket(own, plan.port->index, plan.port->name, *plan.bucket);
        } else {
            Kernel::DeleteRootQdisc(own, plan.port->index, plan.port->name);
        }
    }
    if (plans.empty() || Kernel::DryRun()) return;  // a dry run changed nothing to read back
    const auto after = Kernel::ListRootQdiscs(own);
    for (const auto& plan : plans) {
        const Kernel::RootQdisc* root = nullptr;
        for (const auto& candidate : after) {
            if (candidate.link == plan.port->index) root = &candidate;
        }
        const bool shaped = root && root->bucket;
        if (plan.bucket ? !shaped || !SameBucket(*plan.bucket, *root->bucket) : shaped) {
            throw HostCtlException("The token bucket of " + plan.port->name +
                                   " is not that of the shaping policy after it was carried out");
        }
    }
}

void LinuxSwitches::CheckTeaming(const std::string& owner, const Backend::SwitchPolicy& stored,
                                 const SwitchRecord& record, const std::vector<std::string>& uplinks) const {
    const bool bonding = HasBonding();
    const std::string refused = "Unable to update the teaming policy of " + owner + ": ";
    if (auto why = TeamingRefusal(stored.teaming, uplinks, bonding); !why.empty())
        throw HostCtlException(refused + why);
    for (const auto& group : record.portGroups) {
        auto why = TeamingRefusal(Overlay(stored.teaming, group.policy.teaming), uplinks, bonding);
        if (why.empty()) continue;
        const std::string where = "port group " + group.name;
        throw HostCtlException(refused + (owner == where ? "" : "in " + where + ", ") + why);
    }
}

// ---------------------------------------------------------------- writing policies

namespace {
// The port group of a switch's record, read again once the document is locked.
PortGroupRecord& OwnGroup(SwitchRecord& record, const std::string& name) {
    auto* group = record.FindPortGroup(name);
    if (!group) throw HostCtlException("Port group " + name + " does not exist");
    return *group;
}
}  // namespace

void LinuxSwitches::WriteTeaming(const std::string& name, const Net::NicTeamingPolicy& policy) {
    auto view = Look();
    const auto& bridge = Bridge(view, name);
    context_.BeginChange();
    auto records = Records();
    auto record = RecordOf(records, name);
    record.policy.teaming = policy;
    CheckTeaming("virtual switch " + name, record.policy, record, UplinkNames(view, bridge));
    records[name] = record;
    Store(std::move(records), view);
}

void LinuxSwitches::WriteSecurity(const std::string& name, const Net::PortSecurityPolicy& policy) {
    auto view = Look();
    const auto& bridge = Bridge(view, name);
    if (auto why = SecurityRefusal(policy); !why.empty())
        throw HostCtlException("Unable to update the security policy of virtual switch " + name + ": " + why);
    context_.BeginChange();
    auto records = Records();
    auto record = RecordOf(records, name);
    record.policy.security = policy;
    ApplySecurity(view, bridge, record);
    records[name] = record;
    Store(std::move(records), view);
}

void LinuxSwitches::WriteShaping(const std::string& name, const Net::ShapingPolicy& policy) {
    auto view = Look();
    const auto& bridge = Bridge(view, name);
    context_.BeginChange();
    auto records = Records();
    auto record = RecordOf(records, name);
    record.policy.shaping = policy;
    ApplyShaping(view, bridge, record);
    records[name] = record;
    Store(std::move(records), view);
}

void LinuxSwitches::WritePortGroupTeaming(const std::string& name, const Net::NicTeamingPolicy& own) {
    auto view = Look();
    const std::string vswitch = Group(view, Records(), name).first;
    const auto& bridge = Bridge(view, vswitch);
    context_.BeginChange();
    auto records = Records();
    auto record = RecordOf(records, vswitch);
    OwnGroup(record, name).policy.teaming = own;
    CheckTeaming("port group " + name, record.policy, record, UplinkNames(view, bridge));
    records[vswitch] = record;
    Store(std::move(records), view);
}

void LinuxSwitches::WritePortGroupSecurity(const std::string& name, const Net::PortSecurityPolicy& own) {
    auto view = Look();
    const std::string vswitch = Group(view, Records(), name).first;
    const auto& bridge = Bridge(view, vswitch);
    context_.BeginChange();
    auto records = Records();
    auto record = RecordOf(records, vswitch);
    OwnGroup(record, name).policy.security = own;
    if (auto why = SecurityRefusal(Overlay(record.policy.security, own)); !why.empty())
        throw HostCtlException("Unable to update the security policy of port group " + name + ": " + why);
    ApplySecurity(view, bridge, record);
    records[vswitch] = record;
    Store(std::move(records), view);
}

void LinuxSwitches::WritePortGroupShaping(const std::string& name, const Net::ShapingPolicy& own) {
    auto view = Look();
    const std::string vswitch = Group(view, Records(), name).first;
    const auto& bridge = Bridge(view, vswitch);
    context_.BeginChange();
    auto records = Records();
    auto record = RecordOf(records, vswitch);
    OwnGroup(record, name).policy.shaping = own;
    ApplyShaping(view, bridge, record);
    records[vswitch] = record;
    Store(std::move(records), view);
}

}  // namespace TknCtl::Linux

// The standard switches of the Linux host: bridges of the default netstack, their uplinks, MTU
// and what the document keeps of them (network/vswitch.h says how).
#include "network/vswitch.h"

#include "network/pnic.h"
#include "network/tknnic.h"

#include <unistd.h>

#include <algorithm>
#include <set>
#include <stdexcept>

#include <nlohmann/json.hpp>

#include "core/context.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "kernel/links.h"
#include "network/areas.h"
#include "network/vswitch_model.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;
using nlohmann::json;
namespace Net = HostCtl::Network;

namespace {

constexpr const char* kMember = "vswitches";
// A bridge has at most this many ports (BR_MAX_PORTS).
constexpr std::uint32_t kBridgeMaxPorts = 1024;
constexpr unsigned kNewBridgeMtu = 1500;

Kernel::LinkChange Up() {
    Kernel::LinkChange change;
    change.up = true;
    return change;
}

Kernel::LinkChange Mtu(unsigned mtu) {
    Kernel::LinkChange change;
    change.mtu = mtu;
    return change;
}

Kernel::LinkChange Master(int bridge) {
    Kernel::LinkChange change;
    change.master = bridge;
    return change;
}

[[noreturn]] void Fault(const std::string& where, const std::string& what) {
    throw std::invalid_argument(where + ": " + what);
}

template <class Read>
void Members(const json& value, const std::string& where, Read read) {
    if (!value.is_object()) Fault(where, "not an object");
    for (const auto& [field, item] : value.items()) {
        if (!read(field, item))
            Fault(where, "member " + Lib::Quote(field) + " is unknown or of the wrong type");
    }
}

// A whole number from low to high: read from a file it is unsigned, written in this session it
// may be a signed one.
bool Unsigned(const json& item, std::uint64_t low, std::uint64_t high) {
    if (!item.is_number_integer() || (!item.is_number_unsigned() && item.get<std::int64_t>() < 0))
        return false;
    return item.get<std::uint64_t>() >= low && item.get<std::uint64_t>() <= high;
}

bool Strings(const json& item, std::vector<std::string>& out) {
    if (!item.is_array()) return false;
    for (const auto& entry : item) {
        if (!entry.is_string()) return false;
        out.push_back(entry.get<std::string>());
    }
    return true;
}

Net::NicTeamingPolicy ParseTeaming(const json& value, const std::string& where) {
    Net::NicTeamingPolicy policy;
    Members(value, where, [&](const std::string& field, const json& item) {
        if (field == "loadBalancing" &&
            Unsigned(item, Net::NicTeamingPolicy::TEAM_IPHASH, Net::NicTeamingPolicy::TEAM_EXPLICIT)) {
            policy.SetTeamingPolicy(static_cast<Net::NicTeamingPolicy::TeamPolicyType>(item.get<int>()));
        } else if (field == "notifySwitches" && item.is_boolean()) {
            policy.SetNotifySwitchOnFailure(item.get<bool>());
        } else if (field == "rollingRestoration" && item.is_boolean()) {
            policy.SetRollingRestoration(item.get<bool>());
        } else if (field == "linkCriteria" && item.is_object()) {
            Net::LinkCriteriaSelectionPolicy criteria;
            Members(item, where + ".linkCriteria", [&](const std::string& name, const json& beacon) {
                if (name != "beacon" || !beacon.is_boolean()) return false;
                criteria.SetBeacon(beacon.get<bool>());
                return true;
            });
            policy.SetLinkCriteria(criteria);
        } else if (field == "uplinkOrder") {
            std::vector<std::string> order;
            if (!Strings(item, order)) return false;
            policy.SetUplinkOrder(order);
        } else if (field == "maxActiveUplinks" && Unsigned(item, 0, INT32_MAX)) {
            policy.SetMaxActiveUplinks(item.get<int>());
        } else {
            return false;
        }
        return true;
    });
    return policy;
}

json TeamingJson(const Net::NicTeamingPolicy& policy) {
    json out = json::object();
    if (policy.IsTeamingPolicySet()) out["loadBalancing"] = static_cast<int>(policy.GetTeamingPolicy());
    if (policy.IsNotifySwitchOnFailureSet()) out["notifySwitches"] = policy.GetNotifySwitchOnFailure();
    if (policy.IsRollingRestorationSet()) out["rollingRestoration"] = policy.GetRollingRestoration();
    if (policy.IsLinkCriteriaSet()) {
        json criteria = json::object();
        if (policy.GetLinkCriteria().IsBeaconSet()) criteria["beacon"] = policy.GetLinkCriteria().GetBeacon();
        out["linkCriteria"] = std::move(criteria);
    }
    if (policy.IsUplinkOrderSet()) out["uplinkOrder"] = policy.GetUplinkOrder();
    if (policy.IsMaxActiveUplinksSet()) out["maxActiveUplinks"] = policy.GetMaxActiveUplinks();
    return out;
}

Net::PortSecurityPolicy ParseSecurity(const json& value, const std::string& where) {
    Net::PortSecurityPolicy policy;
    Members(value, where, [&](const std::string& field, const json& item) {
        if (!item.is_boolean()) return false;
        if (field == "allowPromiscuous") {
            policy.SetAllowPromiscuous(item.get<bool>());
        } else if (field == "allowMacChange") {
            policy.SetAllowMacAddressChange(item.get<bool>());
        } else if (field == "allowForgedTransmits") {
            policy.SetAllowForgedTransmits(item.get<bool>());
        } else {
            return false;
        }
        return true;
    });
    return policy;
}

json SecurityJson(const Net::PortSecurityPolicy& policy) {
    json out = json::object();
    if (policy.IsAllowPromiscuousSet()) out["allowPromiscuous"] = policy.GetAllowPromiscuous();
    if (policy.IsAllowMacAddressChangeSet()) out["allowMacChange"] = policy.GetAllowMacAddressChange();
    if (policy.IsAllowForgedTransmitsSet()) out["allowForgedTransmits"] = policy.GetAllowForgedTransmits();
    return out;
}

Net::ShapingPolicy ParseShaping(const json& value, const std::string& where) {
    Net::ShapingPolicy policy;
    Members(value, where, [&](const std::string& field, const json& item) {
        if (field == "enabled" && item.is_boolean()) {
            policy.SetEnabled(item.get<bool>());
        } else if (!Unsigned(item, 0, UINT64_MAX)) {
            return false;
        } else if (field == "averageBps") {
            policy.SetAverageBps(item.get<std::uint64_t>());
        } else if (field == "peakBps") {
            policy.SetPeakBps(item.get<std::uint64_t>());
        } else if (field == "burstSize") {
            policy.SetBurstSize(item.get<std::uint64_t>());
        } else {
            return false;
        }
        return true;
    });
    return policy;
}

json ShapingJson(const Net::ShapingPolicy& policy) {
    json out = json::object();
    if (policy.IsEnabledSet()) out["enabled"] = policy.IsEnabled();
    if (policy.IsAverageBpsSet()) out["averageBps"] = policy.GetAverageBps();
    if (policy.IsPeakBpsSet()) out["peakBps"] = policy.GetPeakBps();
    if (policy.IsBurstSizeSet()) out["burstSize"] = policy.GetBurstSize();
    return out;
}

Backend::SwitchPolicy ParsePolicy(const json& value, const std::string& where) {
    Backend::SwitchPolicy policy;
    Members(value, where, [&](const std::string& field, const json& item) {
        if (field == "teaming") {
            policy.teaming = ParseTeaming(item, where + ".teaming");
        } else if (field == "security") {
            policy.security = ParseSecurity(item, where + ".security");
        } else if (field == "shaping") {
            policy.shaping = ParseShaping(item, where + ".shaping");
        } else {
            return false;
        }
        return true;
    });
    return policy;
}

json PolicyJson(const Backend::SwitchPolicy& policy) {
    json out = json::object();
    if (auto teaming = TeamingJson(policy.teaming); !teaming.empty()) out["teaming"] = std::move(teaming);
    if (auto security = SecurityJson(policy.security); !security.empty())
        out["security"] = std::move(security);
    if (auto shaping = ShapingJson(policy.shaping); !shaping.empty()) out["shaping"] = std::move(shaping);
    return out;
}

PortGroupRecord ParsePortGroup(const json& value, const std::string& where) {
    PortGroupRecord group;
    bool named = false;
    Members(value, where, [&](const std::string& field, const json& item) {
        if (field == "name" && item.is_string() && !item.get<std::string>().empty()) {
            group.name = item.get<std::string>();
            named = true;
        } else if (field == "vlanId" && Unsigned(item, 0, Net::PortGroup::MAX_VLAN_ID)) {
            group.vlanId = item.get<std::uint16_t>();
        } else if (field == "policy") {
            group.policy = ParsePolicy(item, where + ".policy");
        } else if (field == "ports") {
            if (!Strings(item, group.ports)) return false;
        } else {
            return false;
        }
        return true;
    });
    if (!named) Fault(where, "a port group needs a name");
    return group;
}

}  // namespace

const PortGroupRecord* SwitchRecord::FindPortGroup(const std::string& name) const {
    for (const auto& group : portGroups) {
        if (group.name == name) return &group;
    }
    return nullptr;
}

PortGroupRecord* SwitchRecord::FindPortGroup(const std::string& name) {
    return const_cast<PortGroupRecord*>(std::as_const(*this).FindPortGroup(name));
}

bool IsDeviceName(const std::string& name) {
    if (name.empty() || name.size() > 15 || name == "." || name == "..") return false;
    return std::none_of(name.begin(), name.end(),
                        [](unsigned char c) { return c == '/' || c == ':' || c <= ' ' || c == 0x7f; });
}

SwitchRecords ParseSwitchRecords(const json& member) {
    SwitchRecords records;
    if (member.is_null()) return records;
    if (!member.is_object()) throw std::invalid_argument("not an object");
    std::set<std::string> groups;
    for (const auto& [name, value] : member.items()) {
        const std::string where = Lib::Quote(name);
        if (!IsDeviceName(name)) Fault(where, "no name a bridge can have");
        SwitchRecord record;
        Members(value, where, [&](const std::string& field, const json& item) {
            if (field == "ports" && Unsigned(item, 1, 4096)) {
                record.ports = item.get<std::uint32_t>();
            } else if (field == "cdpStatus" && Unsigned(item, 0, 3)) {
                record.cdpStatus = item.get<std::uint32_t>();
            } else if (field == "beacon") {
                Members(item, where + ".beacon", [&](const std::string& key, const json& beacon) {
                    if (key == "enabled" && beacon.is_boolean()) {
                        record.beaconEnabled = beacon.get<bool>();
                    } else if (key == "interval" && Unsigned(beacon, 0, INT32_MAX)) {
                        record.beaconInterval = beacon.get<std::uint32_t>();
                    } else if (key == "threshold" && Unsigned(beacon, 0, INT32_MAX)) {
                        record.beaconThreshold = beacon.get<std::uint32_t>();
                    } else if (key == "requiredBy") {
                        return Strings(beacon, record.beaconRequiredBy);
                    } else {
                        return false;
                    }
                    return true;
                });
            } else if (field == "policy") {
                record.policy = ParsePolicy(item, where + ".policy");
            } else if (field == "portGroups" && item.is_array()) {
                for (const auto& entry : item) {
                    auto group = ParsePortGroup(entry, where + ".portGroups");
                    if (!groups.insert(group.name).second)
                        Fault(where, "port group " + Lib::Quote(group.name) + " appears twice");
                    record.portGroups.push_back(std::move(group));
                }
            } else {
                return false;
            }
            return true;
        });
        records.emplace(name, std::move(record));
    }
    return records;
}

json SwitchRecordsJson(const SwitchRecords& records) {
    json member = json::object();
    for (const auto& [name, record] : records) {
        json groups = json::array();
        for (const auto& group : record.portGroups) {
            groups.push_back({{"name", group.name},
                              {"vlanId", group.vlanId},
                              {"policy", PolicyJson(group.policy)},
                              {"ports", group.ports}});
        }
        member[name] = {{"ports", record.ports},
                        {"cdpStatus", record.cdpStatus},
                        {"beacon",
                         {{"enabled", record.beaconEnabled},
                          {"interval", record.beaconInterval},
                          {"threshold", record.beaconThreshold},
                          {"requiredBy", record.beaconRequiredBy}}},
                        {"policy", PolicyJson(record.policy)},
                        {"portGroups", std::move(groups)}};
    }
    return member;
}

std::string NicHolder(const std::vector<Kernel::BridgeLink>& links, const Kernel::BridgeLink& nic) {
    auto named = [](const Kernel::BridgeLink& link) {
        return (link.kind.empty() ? std::string() : link.kind + " device ") + link.name;
    };
    if (nic.master != 0) {
        for (const auto& master : links) {
            if (master.index != nic.master) continue;
            if (master.bridge) return "it is an uplink of virtual switch " + master.name;
            return "it is a port of " + named(master);
        }
        return "it is a port of device " + std::to_string(nic.master);
    }
    for (const auto& upper : links) {
        const bool takesFrames = upper.kind == "macvlan" || upper.kind == "macvtap" ||
                                 upper.kind == "ipvlan" || upper.kind == "ipvtap";
        if (takesFrames && upper.peer == nic.index && !upper.peerNamespaceId)
            return "it carries " + named(upper) + ", which takes its frames before a bridge could";
    }
    return {};
}

// ---------------------------------------------------------------- the area: looking

LinuxSwitches::LinuxSwitches(Context& context) : context_(context) {}

const Kernel::BridgeLink* LinuxSwitches::View::Find(const std::string& name) const {
    for (const auto& link : links) {
        if (link.name == name) return &link;
    }
    return nullptr;
}

const Kernel::BridgeLink* LinuxSwitches::View::ByIndex(int index) const {
    for (const auto& link : links) {
        if (link.index == index) return &link;
    }
    return nullptr;
}

std::vector<const Kernel::BridgeLink*> LinuxSwitches::View::PortsOf(const Kernel::BridgeLink& bridge) const {
    std::vector<const Kernel::BridgeLink*> ports;
    for (const auto& link : links) {
        if (link.master == bridge.index && link.port) ports.push_back(&link);
    }
    return ports;
}

LinuxSwitches::View LinuxSwitches::Look() const {
    return View{Kernel::ListBridgeLinks(Kernel::Namespace::Own())};
}

bool LinuxSwitches::IsNic(const Kernel::BridgeLink& link) const {
    return !link.bridge && link.name != "lo" && IsDeviceName(link.name) &&
           IsPhysicalNic(context_.GetConfig(), sysfs_, link.name);
}

const Kernel::BridgeLink& LinuxSwitches::Bridge(const View& view, const std::string& name) const {
    const auto* link = view.Find(name);
    if (!link || !link->bridge) throw HostCtlException("Virtual switch " + name + " does not exist");
    return *link;
}

std::vector<std::string> LinuxSwitches::UplinkNames(const View& view,
                                                    const Kernel::BridgeLink& bridge) const {
    std::vector<std::string> names;
    for (const auto* port : view.PortsOf(bridge)) {
        if (IsNic(*port)) names.push_back(port->name);
    }
    return names;
}

bool LinuxSwitches::HasBonding() const {
    return access("/sys/module/bonding", F_OK) == 0;
}

// ---------------------------------------------------------------- the area: the document

SwitchRecords LinuxSwitches::Records() {
    try {
        return ParseSwitchRecords(context_.GetDocument().Read(kMember));
    } catch (const std::invalid_argument& fault) {
        context_.GetDocument().Refuse(kMember, fault.what());
    }
}

SwitchRecord LinuxSwitches::RecordOf(const SwitchRecords& records, const std::string& name) const {
    // The host's defaults under what the document says of the switch.
    SwitchRecord record;
    const auto host = Network::VSwitchModel::DefaultPolicy();
    Backend::SwitchPolicy defaults{Network::VSwitchModel::ToPublic(host.teaming),
                                   Network::VSwitchModel::ToPublic(host.security),
                                   Network::VSwitchModel::ToPublic(host.shaping)};
    if (auto it = records.find(name); it != records.end()) record = it->second;
    record.policy.teaming = Overlay(defaults.teaming, record.policy.teaming);
    record.policy.security = Overlay(defaults.security, record.policy.security);
    record.policy.shaping = Overlay(defaults.shaping, record.policy.shaping);
    return record;
}

void LinuxSwitches::Store(SwitchRecords records, const View& view) {
    // What the kernel no longer has goes: switches whose bridge is gone, ports that left.
    for (auto it = records.begin(); it != records.end();) {
        const auto* bridge = view.Find(it->first);
        if (!bridge || !bridge->bridge) {
            it = records.erase(it);
            continue;
        }
        for (auto& group : it->second.portGroups) {
            std::erase_if(group.ports, [&](const std::string& port) {
                const auto* link = view.Find(port);
                return !link || link->master != bridge->index;
            });
        }
        ++it;
    }
    const json& current = context_.GetDocument().Read(kMember);
    json wanted = SwitchRecordsJson(records);
    if (current == wanted || (current.is_null() && records.empty())) return;
    context_.GetDocument().Write(kMember) = std::move(wanted);
}

// ---------------------------------------------------------------- switches

std::vector<std::string> LinuxSwitches::List() {
    std::vector<std::string> names;
    for (const auto& link : Look().links) {
        if (link.bridge) names.push_back(link.name);
    }
    return names;
}

bool LinuxSwitches::Has(const std::string& name) {
    const auto view = Look();
    const auto* link = view.Find(name);
    return link && link->bridge;
}

Backend::SwitchState LinuxSwitches::Read(const std::string& name) {
    auto view = Look();
    const auto& bridge = Bridge(view, name);
    auto record = RecordOf(Records(), name);
    Backend::SwitchState state;
    state.name = name;
    state.className = "bridge";
    state.numPorts = state.configuredPorts = record.ports;
    state.usedPorts = static_cast<std::uint32_t>(view.PortsOf(bridge).size());
    state.mtu = static_cast<int>(bridge.mtu);
    state.cdpStatus = record.cdpStatus;
    state.beaconEnabled = record.beaconEnabled;
    state.beaconInterval = static_cast<int>(record.beaconInterval);
    state.beaconThreshold = static_cast<int>(record.beaconThreshold);
    state.beaconRequiredBy = record.beaconRequiredBy;
    state.uplinks = UplinkNames(view, bridge);
    for (const auto& group : record.portGroups)
        state.portGroups.push_back(group.name);
    return state;
}

Backend::SwitchPolicy LinuxSwitches::ReadPolicy(const std::string& name) {
    Bridge(Look(), name);
    return RecordOf(Records(), name).policy;
}

void LinuxSwitches::Add(const std::string& name, std::uint32_t numPorts,
                        const Backend::SwitchPolicy& policy) {
    const std::string refused = "Unable to create virtual switch " + name + ": ";
    if (!IsDeviceName(name)) {
        throw HostCtlException(refused + "a bridge's name has at most 15 characters (the kernel's IFNAMSIZ)");
    }
    if (numPorts > kBridgeMaxPorts) {
        throw HostCtlException(refused + "a bridge has at most " + std::to_string(kBridgeMaxPorts) +
                               " ports (the kernel's BR_MAX_PORTS), not " + std::to_string(numPorts));
    }
    if (auto why = SecurityRefusal(policy.security); !why.empty()) throw HostCtlException(refused + why);
    if (auto why = TeamingRefusal(policy.teaming, {}, HasBonding()); !why.empty())
        throw HostCtlException(refused + why);
    if (policy.shaping.IsEnabled()) {
        std::string why;
        if (!ShapingBucket(policy.shaping, kNewBridgeMtu, why)) throw HostCtlException(refused + why);
    }
    context_.BeginChange();
    auto view = Look();
    if (const auto* link = view.Find(name)) {
        throw HostCtlException(refused + "the host has a network device of that name" +
                               (link->kind.empty() ? std::string() : " (" + link->kind + ")"));
    }
    const auto own = Kernel::Namespace::Own();
    Kernel::AddBridge(own, name, kNewBridgeMtu);
    try {
        Kernel::ChangeLink(own, name, Up());
        view = Look();
        const auto* bridge = view.Find(name);
        // (A dry run changed nothing to read back, here and after the changes below; the view
        // shows what it would have done to links.)
        if (!Kernel::DryRun() && (!bridge || !bridge->bridge || !bridge->up))
            throw HostCtlException("Bridge " + name + " is not there, up, after it was made");
    } catch (...) {
        const auto after = Look();
        if (const auto* made = after.Find(name)) Kernel::DeleteLink(own, made->index, name);
        throw;
    }
    auto records = Records();
    SwitchRecord record;
    record.ports = numPorts;
    record.policy = policy;
    records[name] = record;
    Store(std::move(records), view);
}

void LinuxSwitches::Remove(const std::string& name) {
    const std::string refused = "Unable to remove virtual switch " + name + ": ";
    auto view = Look();
    const auto& bridge = Bridge(view, name);
    context_.BeginChange();
    const auto own = Kernel::Namespace::Own();
    std::vector<std::string> held;
    for (const auto& address : Kernel::ListLinkAddresses(own, bridge.index)) {
        if (!address.kernelLinkLocal) held.push_back(address.address);
    }
    if (!held.empty()) {
        std::string list;
        for (const auto& address : held)
            list += (list.empty() ? "" : ", ") + address;
        throw HostCtlException(refused + "its bridge carries the host's address" +
                               (held.size() > 1 ? "es " : " ") + list);
    }
    std::vector<const Kernel::BridgeLink*> uplinks;
    for (const auto* port : view.PortsOf(bridge)) {
        if (!IsNic(*port)) {
            throw HostCtlException(refused + "port " + port->name +
                                   (port->kind.empty() ? std::string() : " (" + port->kind + ")") +
                                   " is connected to it");
        }
        uplinks.push_back(port);
    }
    // The uplinks are given back as they were: without the switch's shaping.
    const auto roots = Kernel::ListRootQdiscs(own);
    for (const auto* uplink : uplinks) {
        for (const auto& root : roots) {
            if (root.link == uplink->index && root.kind == "tbf")
                Kernel::DeleteRootQdisc(own, uplink->index, uplink->name);
        }
    }
    Kernel::DeleteLink(own, bridge.index, name);
    view = Look();
    if (const auto* still = view.Find(name); still && still->bridge && !Kernel::DryRun())
        throw HostCtlException("Bridge " + name + " is still there after its removal");
    Store(Records(), view);
}

void LinuxSwitches::SetMtu(const std::string& name, int mtu) {
    auto view = Look();
    const auto& bridge = Bridge(view, name);
    context_.BeginChange();
    const auto own = Kernel::Namespace::Own();
    const auto wanted = static_cast<unsigned>(mtu);
    // A shaped uplink's token bucket is made for its frames: it must take the larger ones too.
    const auto record = RecordOf(Records(), name);
    if (record.policy.shaping.IsEnabled()) {
        for (const auto& uplink : UplinkNames(view, bridge)) {
            std::string why;
            if (!ShapingBucket(record.policy.shaping, wanted, why)) {
                throw HostCtlException("Unable to set the MTU of virtual switch " + name + " to " +
                                       std::to_string(mtu) + ": the shaping of uplink " + uplink +
                                       " could not follow: " + why);
            }
        }
    }
    // The uplinks carry the switch's frames: they take its MTU first, so that the bridge never
    // sends them a frame they cannot carry; so do the bridge ends of interfaces (network/tknnic.h).
    // A refusal puts back what was changed.
    auto carries = [&](const Kernel::BridgeLink& port) {
        return IsNic(port) || InterfaceOfBridgeEnd(port.name).has_value();
    };
    std::vector<std::pair<std::string, unsigned>> changed;
    try {
        for (const auto* port : view.PortsOf(bridge)) {
            if (!carries(*port) || port->mtu == wanted) continue;
            Kernel::ChangeLink(own, port->name, Mtu(wanted));
            changed.emplace_back(port->name, port->mtu);
        }
        if (bridge.mtu != wanted) Kernel::ChangeLink(own, name, Mtu(wanted));
    } catch (...) {
        for (const auto& [port, before] : changed) {
            try {
                Kernel::ChangeLink(own, port, Mtu(before));
            } catch (const HostCtlException&) {
                context_.Warn("The MTU of " + port + " could not be put back to " + std::to_string(before));
            }
        }
        throw;
    }
    view = Look();
    const auto& after = Bridge(view, name);
    std::string differs = after.mtu != wanted ? name : std::string();
    for (const auto* port : view.PortsOf(after)) {
        if (carries(*port) && port->mtu != wanted) differs = port->name;
    }
    if (!differs.empty() && !Kernel::DryRun()) {
        throw HostCtlException("The MTU of " + differs + " is not " + std::to_string(mtu) +
                               " after the MTU of virtual switch " + name + " was set");
    }
    ApplyShaping(view, after, record);
}

void LinuxSwitches::SetCdpStatus(const std::string& name, std::uint32_t status) {
    auto view = Look();
    Bridge(view, name);
    context_.BeginChange();
    auto records = Records();
    auto record = RecordOf(records, name);
    if (record.cdpStatus == status && records.count(name)) return;
    record.cdpStatus = status;
    records[name] = record;
    Store(std::move(records), view);
}

void LinuxSwitches::AddUplink(const std::string& name, const std::string& nic) {
    const std::string refused = "Unable to add uplink " + nic + " to virtual switch " + name + ": ";
    auto view = Look();
    const auto& bridge = Bridge(view, name);
    const auto* link = view.Find(nic);
    if (!link || !IsNic(*link)) throw HostCtlException(refused + "the host has no physical NIC of that name");
    context_.BeginChange();
    if (link->master == bridge.index) throw HostCtlException(refused + "the switch already has it");
    if (auto why = NicHolder(view.links, *link); !why.empty()) throw HostCtlException(refused + why);
    const auto own = Kernel::Namespace::Own();
    std::vector<std::string> held;
    for (const auto& address : Kernel::ListLinkAddresses(own, link->index)) {
        if (!address.kernelLinkLocal) held.push_back(address.address);
    }
    if (!held.empty()) {
        std::string list;
        for (const auto& address : held)
            list += (list.empty() ? "" : ", ") + address;
        throw HostCtlException(refused + nic + " holds the address" + (held.size() > 1 ? "es " : " ") + list +
                               ": a bridge port carries no IP configuration of its own; remove " +
                               (held.size() > 1 ? "them" : "it") + " first");
    }
    auto records = Records();
    auto record = RecordOf(records, name);
    const auto ports = view.PortsOf(bridge);
    if (ports.size() >= record.ports) throw HostCtlException(refused + "the switch has no free port");
    const auto uplinks = UplinkNames(view, bridge);
    if (!uplinks.empty()) {
        throw HostCtlException(
            refused + "it would be a second uplink beside " + uplinks.front() +
            ": a bridge forwards on every uplink it has, and more than one needs the bonding "
            "driver, " +
            (HasBonding() ? std::string("which the Linux host does not use yet")
                          : std::string("which this kernel does not have (CONFIG_BONDING)")));
    }
    // A bridge makes the uplink active: where a failover order is kept, it joins its actives.
    auto activate = [&](Net::NicTeamingPolicy& teaming) {
        if (!teaming.IsUplinkOrderSet()) return;
        auto order = teaming.GetUplinkOrder();
        order.push_back(nic);
        teaming.SetUplinkOrder(order);
        if (teaming.IsMaxActiveUplinksSet()) teaming.SetMaxActiveUplinks(static_cast<int>(order.size()));
    };
    activate(record.policy.teaming);
    for (auto& group : record.portGroups)
        activate(group.policy.teaming);

    // The NIC takes the switch's MTU and joins the bridge with the switch's shaping; a step the
    // kernel refuses puts back what was done. (The view is read anew: keep what is needed of it.)
    const unsigned mtuBefore = link->mtu;
    const int bridgeIndex = bridge.index;
    const unsigned bridgeMtu = bridge.mtu;
    try {
        if (mtuBefore != bridgeMtu) Kernel::ChangeLink(own, nic, Mtu(bridgeMtu));
        Kernel::ChangeLink(own, nic, Master(bridgeIndex));
        view = Look();
        const auto& joined = Bridge(view, name);
        const auto* port = view.Find(nic);
        if (!Kernel::DryRun() && (!port || port->master != joined.index || !port->port))
            throw HostCtlException(nic + " is not a port of bridge " + name + " after it was added");
        if (!Kernel::DryRun() && port->mtu != joined.mtu)
            throw HostCtlException("The MTU of " + nic + " is not the switch's after it was added");
        ApplyShaping(view, joined, record, nic);
        ApplyVlans(view, joined, record);
    } catch (...) {
        try {
            auto now = Look();
            if (const auto* port = now.Find(nic)) {
                for (const auto& root : Kernel::ListRootQdiscs(own)) {
                    if (root.link == port->index && root.kind == "tbf")
                        Kernel::DeleteRootQdisc(own, port->index, nic);
                }
                if (port->master == bridgeIndex) Kernel::ChangeLink(own, nic, Master(0));
                if (port->mtu != mtuBefore) Kernel::ChangeLink(own, nic, Mtu(mtuBefore));
            }
        } catch (const HostCtlException&) {
            context_.Warn(nic + " could not be put back as it was before it was added to virtual switch " +
                          name);
        }
        throw;
    }
    records[name] = record;
    Store(std::move(records), view);
}

void LinuxSwitches::RemoveUplink(const std::string& name, const std::string& nic) {
    auto view = Look();
    const auto& bridge = Bridge(view, name);
    const auto* port = view.Find(nic);
    if (!port || port->master != bridge.index || !IsNic(*port)) {
        throw HostCtlException("Unable to remove uplink " + nic + " from virtual switch " + name +
                               ": the switch has no such uplink");
    }
    context_.BeginChange();
    const auto own = Kernel::Namespace::Own();
    // The NIC is given back without the switch's shaping.
    for (const auto& root : Kernel::ListRootQdiscs(own)) {
        if (root.link == port->index && root.kind == "tbf") Kernel::DeleteRootQdisc(own, port->index, nic);
    }
    Kernel::ChangeLink(own, nic, Master(0));
    view = Look();
    if (const auto* after = view.Find(nic); after && after->master != 0 && !Kernel::DryRun())
        throw HostCtlException(nic + " is still a port of bridge " + name + " after its removal");
    Store(Records(), view);
}

std::vector<std::string> LinuxSwitches::PhysicalNics() {
    std::vector<std::string> names;
    for (const auto& link : Look().links) {
        if (IsNic(link)) names.push_back(link.name);
    }
    return names;
}

std::unique_ptr<Backend::Switches> MakeSwitches(Context& context) {
    return std::make_unique<LinuxSwitches>(context);
}

}  // namespace TknCtl::Linux

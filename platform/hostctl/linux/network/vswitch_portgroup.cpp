// Port groups of the Linux host's switches: names, VLAN IDs and overrides kept in the host's
// document, their ports the bridge ports connected to them, VLANs through bridge VLAN
// filtering where the kernel has it (network/vswitch.h says how).
#include <algorithm>

#include "core/context.h"
#include "hostctl/exception.h"
#include "kernel/links.h"
#include "network/vswitch.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;

std::pair<std::string, PortGroupRecord> LinuxSwitches::Group(const View& view, const SwitchRecords& records,
                                                             const std::string& name) const {
    for (const auto& [vswitch, record] : records) {
        const auto* bridge = view.Find(vswitch);
        if (!bridge || !bridge->bridge) continue;  // gone with its bridge
        if (const auto* group = record.FindPortGroup(name)) return {vswitch, *group};
    }
    throw HostCtlException("Port group " + name + " does not exist");
}

std::vector<Backend::PortGroupState> LinuxSwitches::PortGroups() {
    auto view = Look();
    auto records = Records();
    std::vector<Backend::PortGroupState> groups;
    for (const auto& link : view.links) {
        if (!link.bridge) continue;
        auto record = records.find(link.name);
        if (record == records.end()) continue;
        for (const auto& group : record->second.portGroups) {
            Backend::PortGroupState state;
            state.name = group.name;
            state.vswitch = link.name;
            state.vlanId = group.vlanId;
            state.activeClients = static_cast<std::uint32_t>(
                std::count_if(group.ports.begin(), group.ports.end(), [&](const std::string& port) {
                    const auto* member = view.Find(port);
                    return member && member->master == link.index;
                }));
            groups.push_back(std::move(state));
        }
    }
    return groups;
}

std::optional<Backend::PortGroupState> LinuxSwitches::FindPortGroup(const std::string& name) {
    for (auto& group : PortGroups()) {
        if (group.name == name) return std::move(group);
    }
    return std::nullopt;
}

Backend::SwitchPolicy LinuxSwitches::ReadPortGroupPolicy(const std::string& name) {
    return Group(Look(), Records(), name).second.policy;
}

void LinuxSwitches::AddPortGroup(const std::string& vswitch, const std::string& name) {
    auto view = Look();
    Bridge(view, vswitch);
    context_.BeginChange();
    auto records = Records();
    for (const auto& [holder, record] : records) {
        const auto* bridge = view.Find(holder);
        if (bridge && bridge->bridge && record.FindPortGroup(name)) {
            throw HostCtlException("Unable to add port group " + name + ": virtual switch " + holder +
                                   " already has a port group of that name");
        }
    }
    auto record = RecordOf(records, vswitch);
    PortGroupRecord group;
    group.name = name;
    record.portGroups.push_back(std::move(group));
    records[vswitch] = record;
    Store(std::move(records), view);
}

void LinuxSwitches::RemovePortGroup(const std::string& vswitch, const std::string& name) {
    const std::string refused =
        "Unable to remove port group " + name + " from virtual switch " + vswitch + ": ";
    auto view = Look();
    const auto& bridge = Bridge(view, vswitch);
    context_.BeginChange();
    auto records = Records();
    auto record = RecordOf(records, vswitch);
    const auto* group = record.FindPortGroup(name);
    if (!group) throw HostCtlException(refused + "the switch has no such port group");
    for (const auto& port : group->ports) {
        const auto* link = view.Find(port);
        if (link && link->master == bridge.index)
            throw HostCtlException(refused + "port " + port + " is connected to it");
    }
    std::erase_if(record.portGroups, [&](const PortGroupRecord& g) { return g.name == name; });
    if (bridge.bridge->vlanFiltering) ApplyVlans(view, bridge, record);
    records[vswitch] = record;
    Store(std::move(records), view);
}

void LinuxSwitches::SetVlanId(const std::string& portGroup, std::uint16_t vlanId) {
    auto view = Look();
    const std::string vswitch = Group(view, Records(), portGroup).first;
    const auto& bridge = Bridge(view, vswitch);
    const bool tagged = vlanId != 0 && vlanId < HostCtl::Network::PortGroup::MAX_VLAN_ID;
    if (tagged && !bridge.bridge->vlanFilteringAvailable) {
        throw HostCtlException("Unable to set the VLAN ID of port group " + portGroup + " to " +
                               std::to_string(vlanId) +
                               ": a VLAN ID needs bridge VLAN filtering, which this kernel does not have "
                               "(CONFIG_BRIDGE_VLAN_FILTERING)");
    }
    context_.BeginChange();
    auto records = Records();
    auto record = RecordOf(records, vswitch);
    auto* group = record.FindPortGroup(portGroup);
    if (!group) throw HostCtlException("Port group " + portGroup + " does not exist");
    group->vlanId = vlanId;
    // A bridge that does not filter VLANs carries every VLAN as it comes (4095), and frames
    // without a tag (0) alike.
    if (bridge.bridge->vlanFilteringAvailable) ApplyVlans(view, bridge, record);
    records[vswitch] = record;
    Store(std::move(records), view);
}

void LinuxSwitches::ConnectPort(const std::string& portGroup, const std::string& port) {
    const std::string refused = "Unable to connect " + port + " to port group " + portGroup + ": ";
    auto view = Look();
    const std::string vswitch = Group(view, Records(), portGroup).first;
    const auto& bridge = Bridge(view, vswitch);
    const auto* link = view.Find(port);
    if (!link) throw HostCtlException(refused + "the host has no network device of that name");
    if (IsNic(*link) || link->bridge) throw HostCtlException(refused + "it is no interface's end");
    if (link->master != 0 && link->master != bridge.index) {
        const auto* master = view.ByIndex(link->master);
        throw HostCtlException(refused + "it is a port of " +
                               (master ? master->name : std::to_string(link->master)));
    }
    context_.BeginChange();
    auto records = Records();
    auto record = RecordOf(records, vswitch);
    if (link->master == 0 && view.PortsOf(bridge).size() >= record.ports)
        throw HostCtlException(refused + "virtual switch " + vswitch + " has no free port");
    for (auto& group : record.portGroups)
        std::erase(group.ports, port);
    record.FindPortGroup(portGroup)->ports.push_back(port);
    const auto own = Kernel::Namespace::Own();
    Kernel::LinkChange join;
    join.master = bridge.index;
    const bool joined = link->master == 0;
    try {
        if (joined) Kernel::ChangeLink(own, port, join);
        view = Look();
        const auto& after = Bridge(view, vswitch);
        const auto* member = view.Find(port);
        // (A dry run's view shows the port joined, as the real run would leave it.)
        if (!member || member->master != after.index || !member->port)
            throw HostCtlException(port + " is not a port of bridge " + vswitch + " after it was connected");
        ApplySecurity(view, after, record, port);
        ApplyShaping(view, after, record, port);
        if (after.bridge->vlanFiltering || after.bridge->vlanFilteringAvailable)
            ApplyVlans(view, after, record);
    } catch (...) {
        if (joined) {
            try {
                Kernel::LinkChange leave;
                leave.master = 0;
                Kernel::ChangeLink(own, port, leave);
            } catch (const HostCtlException&) {
                context_.Warn(port + " could not be taken out of bridge " + vswitch + " again");
            }
        }
        throw;
    }
    records[vswitch] = record;
    Store(std::move(records), view);
}

void LinuxSwitches::DisconnectPort(const std::string& port) {
    auto view = Look();
    auto records = Records();
    std::string vswitch;
    for (const auto& [name, record] : records) {
        for (const auto& group : record.portGroups) {
            if (std::find(group.ports.begin(), group.ports.end(), port) != group.ports.end()) vswitch = name;
        }
    }
    if (vswitch.empty()) return;
    context_.BeginChange();
    records = Records();
    for (auto& group : records[vswitch].portGroups)
        std::erase(group.ports, port);
    const auto own = Kernel::Namespace::Own();
    const auto* link = view.Find(port);
    const auto* bridge = view.Find(vswitch);
    if (link && bridge && link->master == bridge->index) {
        for (const auto& root : Kernel::ListRootQdiscs(own)) {
            if (root.link == link->index && root.kind == "tbf")
                Kernel::DeleteRootQdisc(own, link->index, port);
        }
        Kernel::LinkChange leave;
        leave.master = 0;
        Kernel::ChangeLink(own, port, leave);
        view = Look();
        if (const auto* after = view.Find(port); after && after->master != 0 && !Kernel::DryRun())
            throw HostCtlException(port + " is still a port of bridge " + vswitch +
                                   " after it was disconnected");
    }
    Store(std::move(records), view);
}

std::map<std::string, std::string> LinuxSwitches::ConnectedPorts() {
    auto view = Look();
    std::map<std::string, std::string> ports;
    for (const auto& [vswitch, record] : Records()) {
        const auto* bridge = view.Find(vswitch);
        if (!bridge || !bridge->bridge) continue;
        for (const auto& group : record.portGroups) {
            for (const auto& port : group.ports) {
                const auto* link = view.Find(port);
                if (link && link->master == bridge->index) ports[port] = group.name;
            }
        }
    }
    return ports;
}

void LinuxSwitches::ApplyVlans(const View& view, const Kernel::BridgeLink& bridge,
                               const SwitchRecord& record) {
    std::vector<std::uint16_t> ids;
    bool tagged = false;
    for (const auto& group : record.portGroups) {
        ids.push_back(group.vlanId);
        tagged = tagged || (group.vlanId != 0 && group.vlanId < HostCtl::Network::PortGroup::MAX_VLAN_ID);
    }
    const auto own = Kernel::Namespace::Own();
    if (!bridge.bridge->vlanFiltering) {
        if (!tagged) return;  // nothing a bridge that does not filter cannot carry
        Kernel::SetBridgeVlanFiltering(own, bridge.index, bridge.name, true);
    }
    const auto current = Kernel::ListPortVlans(own);
    auto vlansOf = [&](int index) {
        for (const auto& [port, vlans] : current) {
            if (port == index) return vlans;
        }
        return std::vector<Kernel::PortVlan>();
    };
    const std::uint16_t pvid = bridge.bridge->defaultPvid ? bridge.bridge->defaultPvid : 1;
    std::vector<std::pair<const Kernel::BridgeLink*, std::vector<Kernel::PortVlan>>> plans;
    for (const auto* port : view.PortsOf(bridge)) {
        if (IsNic(*port)) {
            plans.emplace_back(port, UplinkVlans(ids, pvid));
        } else if (const auto* group = GroupOfPort(record, port->name)) {
            plans.emplace_back(port, PortGroupVlans(group->vlanId, pvid));
        }
    }
    for (const auto& [port, vlans] : plans) {
        Kernel::ChangePortVlans(own, port->index, port->name, vlansOf(port->index), false);
        Kernel::ChangePortVlans(own, port->index, port->name, vlans, true);
    }
    if (Kernel::DryRun()) return;  // nothing changed to read back
    const auto after = Kernel::ListPortVlans(own);
    for (const auto& [port, vlans] : plans) {
        std::vector<Kernel::PortVlan> got;
        for (const auto& [index, list] : after) {
            if (index == port->index) got = list;
        }
        // The VLAN the port's untagged frames join, as asked.
        const auto& untagged = vlans.back();
        bool found = std::any_of(got.begin(), got.end(), [&](const Kernel::PortVlan& vlan) {
            return vlan.vid <= untagged.vid && std::max(vlan.vid, vlan.lastVid) >= untagged.vid &&
                   vlan.pvid == untagged.pvid && vlan.untagged == untagged.untagged;
        });
        if (!found)
            throw HostCtlException("The VLANs of bridge port " + port->name +
                                   " are not those asked after they were set");
    }
}

}  // namespace TknCtl::Linux

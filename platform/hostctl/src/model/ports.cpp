#include "model/ports.h"

#include <unordered_set>

#include "model/dvswitches.h"
#include "model/pnics.h"
#include "model/values.h"
#include "model/vswitches.h"
#include "model/worlds.h"

namespace TknCtl::Model {

const Port* PortsSection::Find(std::uint32_t id) const {
    for (const auto& port : ports) {
        if (port.id == id) return &port;
    }
    return nullptr;
}

Port* PortsSection::Find(std::uint32_t id) {
    return const_cast<Port*>(static_cast<const PortsSection*>(this)->Find(id));
}

namespace {

using Json::Field;
using Json::In;
using Json::Node;

const Field<PortStats, std::uint64_t> kPortStats[] = {
    {"rxPackets", &PortStats::rxPackets},     {"txPackets", &PortStats::txPackets},
    {"rxBytes", &PortStats::rxBytes},         {"txBytes", &PortStats::txBytes},
    {"rxBroadcast", &PortStats::rxBroadcast}, {"txBroadcast", &PortStats::txBroadcast},
    {"rxMulticast", &PortStats::rxMulticast}, {"txMulticast", &PortStats::txMulticast},
    {"rxDropped", &PortStats::rxDropped},     {"txDropped", &PortStats::txDropped}};

const Field<FilterStats, std::uint64_t> kFilterCounters[] = {
    {"packetsIn", &FilterStats::packetsIn},
    {"packetsOut", &FilterStats::packetsOut},
    {"packetsDropped", &FilterStats::packetsDropped},
    {"packetsFiltered", &FilterStats::packetsFiltered},
    {"packetsFaulted", &FilterStats::packetsFaulted},
    {"packetsQueued", &FilterStats::packetsQueued},
    {"packetsInjected", &FilterStats::packetsInjected},
    {"packetErrors", &FilterStats::packetErrors}};

void Load(const In& in, PortsSection& section) {
    in.Elements([&](const In& item) {
        Port port;
        port.id = item.Int<std::uint32_t>("id");
        port.switchName = item.Str("switch");
        port.type = Json::NameToCode(item.Member("type"), kPortTypes);
        port.portGroup = item.Str("portGroup", "");
        port.dvPortId = item.Str("dvPortId", "");
        port.client = item.Str("client", "");
        port.worldId = item.Int<std::uint32_t>("worldId", 0);
        if (auto mac = item.OptMember("mac")) port.mac = ReadMac(*mac);
        if (auto ip = item.OptMember("ipv4")) port.ipv4 = ReadIpv4(*ip);
        port.teamUplink = item.Str("teamUplink", "");
        if (auto stats = item.OptMember("stats")) {
            Json::ReadFields(*stats, port.stats, kPortStats);
            stats->Done();
        }
        item.Each("filters", [&](const In& f) {
            FilterStats filter;
            filter.name = f.Str("name");
            filter.valid = f.Bool("valid", true);
            filter.direction = f.Bool("direction", false);
            filter.extendedValid = f.Bool("extendedValid", false);
            Json::ReadFields(f, filter, kFilterCounters);
            f.Done();
            port.filters.push_back(std::move(filter));
        });
        item.Done();
        section.ports.push_back(std::move(port));
    });
}

Node Save(const PortsSection& section) {
    using Json::Append;
    Node out = Node::array();
    for (const auto& p : section.ports) {
        Node filters = Node::array();
        for (const auto& f : p.filters) {
            Node node = Json::Object("name", f.name, "valid", f.valid, "direction", f.direction,
                                     "extendedValid", f.extendedValid);
            for (const auto& field : kFilterCounters)
                Append(node, field.key, f.*field.member);
            filters.push_back(std::move(node));
        }
        Node node = Json::Object("id", p.id, "switch", p.switchName, "type",
                                 p.type < 5 && kPortTypes[p.type] ? kPortTypes[p.type] : "internal");
        if (!p.portGroup.empty()) Append(node, "portGroup", p.portGroup);
        if (!p.dvPortId.empty()) Append(node, "dvPortId", p.dvPortId);
        Append(node, "client", p.client);
        Append(node, "worldId", p.worldId);
        Append(node, "mac", p.mac.GetStringAddress());
        Append(node, "ipv4", p.ipv4.GetStringAddress());
        Append(node, "teamUplink", p.teamUplink);
        Append(node, "stats", Json::WriteFields(p.stats, kPortStats));
        Append(node, "filters", std::move(filters));
        out.push_back(std::move(node));
    }
    return out;
}

void Check(const PortsSection& section, Lib::Checker& checker) {
    std::unordered_set<std::uint32_t> ids;
    const auto& vswitches = checker.Get<VSwitchesSection>();
    const auto& dvswitches = checker.Get<DvSwitchesSection>();
    const auto& worlds = checker.Get<WorldsSection>();
    const auto& pnics = checker.Get<PnicsSection>();
    for (const auto& p : section.ports) {
        std::string where = "port " + std::to_string(p.id) + ": ";
        if (!ids.insert(p.id).second) checker.Fail("duplicate port ID " + std::to_string(p.id));
        if (const auto* vswitch = vswitches.Find(p.switchName)) {
            if (!p.portGroup.empty() && !vswitches.FindPortGroup(p.portGroup)) {
                checker.Fail(where + "unknown port group " + Lib::Quote(p.portGroup));
            }
            if (!p.portGroup.empty() && vswitches.FindPortGroupSwitch(p.portGroup) != vswitch) {
                checker.Fail(where + "port group " + Lib::Quote(p.portGroup) + " is not on " +
                             Lib::Quote(p.switchName));
            }
            if (p.type == kPortVm && p.portGroup.empty())
                checker.Fail(where + "a VM port needs a port group");
        } else if (const auto* dvs = dvswitches.Find(p.switchName)) {
            const auto* dvPort = p.dvPortId.empty() ? nullptr : dvs->FindPort(p.dvPortId);
            if (!p.dvPortId.empty() && !dvPort) {
                checker.Fail(where + "unknown distributed port " + Lib::Quote(p.dvPortId));
            }
            if (p.type == kPortVm && (!dvPort || dvPort->portgroupId.empty())) {
                checker.Fail(where + "a VM port needs a distributed port of a distributed port group");
            }
            // Distributed switches keep their uplinks; a port's team uplink is one of them.
            bool onSwitch = false;
            for (const auto& uplink : dvs->uplinks)
                onSwitch = onSwitch || uplink == p.teamUplink;
            if (!p.teamUplink.empty() && !onSwitch) {
                checker.Fail(where + "team uplink " + Lib::Quote(p.teamUplink) + " is not an uplink of " +
                             Lib::Quote(p.switchName));
            }
        } else {
            checker.Fail(where + "unknown switch " + Lib::Quote(p.switchName));
        }
        if (p.worldId != 0 && !worlds.Find(p.worldId)) {
            checker.Fail(where + "unknown world " + std::to_string(p.worldId));
        }
        if (!p.teamUplink.empty() && !pnics.Find(p.teamUplink)) {
            checker.Fail(where + "team uplink " + Lib::Quote(p.teamUplink) + " is not a physical NIC");
        }
        if (p.type == kPortUplink && !pnics.Find(p.client)) {
            checker.Fail(where + "uplink port of unknown NIC " + Lib::Quote(p.client));
        }
    }
}

}  // namespace

const Lib::SectionKind& PortsSection::Kind() {
    static const Json::JsonSection<PortsSection> kind("ports", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model

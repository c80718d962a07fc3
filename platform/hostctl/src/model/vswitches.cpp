#include "model/vswitches.h"

#include <algorithm>

#include "model/dvswitches.h"
#include "model/pnics.h"
#include "model/tknnics.h"
#include "model/values.h"

namespace TknCtl::Model {

const VSwitch* VSwitchesSection::Find(const std::string& name) const {
    for (const auto& vswitch : switches) {
        if (vswitch.name == name) return &vswitch;
    }
    return nullptr;
}

VSwitch* VSwitchesSection::Find(const std::string& name) {
    return const_cast<VSwitch*>(static_cast<const VSwitchesSection*>(this)->Find(name));
}

namespace {

// The port group of that name and its switch, or nullptrs. Port groups are looked up by name
// for every port, interface and property read: a host with thousands of them must not scan
// them all each time.
std::pair<const VSwitch*, const PortGroup*> LocatePortGroup(const VSwitchesSection& section,
                                                            const std::string& name) {
    auto lookup = [&]() -> std::pair<const VSwitch*, const PortGroup*> {
        auto hit = section.groupIndex.find(name);
        if (hit == section.groupIndex.end()) return {nullptr, nullptr};
        auto [s, g] = hit->second;
        if (s >= section.switches.size() || g >= section.switches[s].portGroups.size() ||
            section.switches[s].portGroups[g].name != name) {
            return {nullptr, nullptr};
        }
        return {&section.switches[s], &section.switches[s].portGroups[g]};
    };
    if (auto found = lookup(); found.second) return found;
    // An unknown name, or the switches changed since the index was made: index them again
    // (the first of a name wins, as a scan would find it).
    section.groupIndex.clear();
    for (std::size_t s = 0; s < section.switches.size(); ++s) {
        for (std::size_t g = 0; g < section.switches[s].portGroups.size(); ++g)
            section.groupIndex.emplace(section.switches[s].portGroups[g].name, std::make_pair(s, g));
    }
    return lookup();
}

}  // namespace

const VSwitch* VSwitchesSection::FindPortGroupSwitch(const std::string& portGroup) const {
    return LocatePortGroup(*this, portGroup).first;
}

const PortGroup* VSwitchesSection::FindPortGroup(const std::string& portGroup) const {
    return LocatePortGroup(*this, portGroup).second;
}

PortGroup* VSwitchesSection::FindPortGroup(const std::string& portGroup) {
    return const_cast<PortGroup*>(static_cast<const VSwitchesSection*>(this)->FindPortGroup(portGroup));
}

namespace {

using Json::In;
using Json::Node;

void Load(const In& in, VSwitchesSection& section) {
    in.Elements([&](const In& item) {
        VSwitch s;
        s.name = item.Str("name");
        s.className = item.Str("className", s.className);
        s.numPorts = item.Int<std::uint32_t>("numPorts", s.numPorts);
        s.configuredPorts = item.Int<std::uint32_t>("configuredPorts", s.configuredPorts);
        s.usedPorts = item.Int<std::uint32_t>("usedPorts", 0);
        s.mtu = item.Int<std::uint32_t>("mtu", s.mtu);
        if (auto cdp = item.OptMember("cdpStatus")) s.cdpStatus = Json::NameToCode(*cdp, kCdpStatusNames);
        if (auto beacon = item.OptMember("beacon")) {
            s.beacon.enabled = beacon->Bool("enabled", false);
            s.beacon.interval = beacon->Int<std::uint32_t>("interval", s.beacon.interval);
            s.beacon.threshold = beacon->Int<std::uint32_t>("threshold", s.beacon.threshold);
            s.beacon.requiredBy = beacon->Strings("requiredBy");
            beacon->Done();
        }
        s.uplinks = item.Strings("uplinks");
        if (auto policy = item.OptMember("policy")) s.policy = LoadPolicy(*policy);
        if (auto capabilities = item.OptMember("capabilities"))
            s.capabilities = LoadCapabilities(*capabilities);
        item.Each("portGroups", [&](const In& pg) {
            PortGroup group;
            group.name = pg.Str("name");
            group.vlanId = pg.Int<std::uint16_t>("vlanId", 0);
            if (auto policy = pg.OptMember("policy")) group.policy = LoadPolicy(*policy);
            group.activeClients = pg.Int<std::uint32_t>("activeClients", 0);
            pg.Done();
            s.portGroups.push_back(std::move(group));
        });
        item.Done();
        section.switches.push_back(std::move(s));
    });
}

Node Save(const VSwitchesSection& section) {
    using Json::Object;
    Node out = Node::array();
    for (const auto& s : section.switches) {
        Node groups = Node::array();
        for (const auto& g : s.portGroups) {
            groups.push_back(Object("name", g.name, "vlanId", g.vlanId, "policy", SavePolicy(g.policy),
                                    "activeClients", g.activeClients));
        }
        out.push_back(Object("name", s.name, "className", s.className, "numPorts", s.numPorts,
                             "configuredPorts", s.configuredPorts, "usedPorts", s.usedPorts, "mtu", s.mtu,
                             "cdpStatus", kCdpStatusNames[s.cdpStatus < 4 ? s.cdpStatus : 3], "beacon",
                             Object("enabled", s.beacon.enabled, "interval", s.beacon.interval, "threshold",
                                    s.beacon.threshold, "requiredBy", s.beacon.requiredBy),
                             "uplinks", s.uplinks, "policy", SavePolicy(s.policy), "capabilities",
                             SaveCapabilities(s.capabilities), "portGroups", std::move(groups)));
    }
    return out;
}

// A teaming order names uplinks of the switch, each once; the active count is not negative.
void CheckTeaming(const TeamingPolicy& teaming, const VSwitch& s, const std::string& where,
                  Lib::Checker& checker) {
    if (teaming.uplinkOrder) {
        for (const auto& name : *teaming.uplinkOrder) {
            if (std::find(s.uplinks.begin(), s.uplinks.end(), name) == s.uplinks.end())
                checker.Fail(where + "teaming order names " + Lib::Quote(name) +
                             ", not an uplink of the switch");
        }
        RequireUnique(
            *teaming.uplinkOrder, [](const std::string& u) { return u; }, checker,
            "uplink in a teaming order");
    }
    if (teaming.maxActive && *teaming.maxActive < 0)
        checker.Fail(where + "negative number of active uplinks");
}

void Check(const VSwitchesSection& section, Lib::Checker& checker) {
    RequireUnique(
        section.switches, [](const VSwitch& s) { return s.name; }, checker, "switch name");
    std::vector<std::string> groups;
    std::vector<std::string> uplinks;
    std::uint64_t hostPorts = 0;
    const auto& pnics = checker.Get<PnicsSection>();
    const auto& dvswitches = checker.Get<DvSwitchesSection>();
    for (const auto& s : section.switches) {
        RequireName(s.name, checker, "switch name");
        std::string where = "switch " + Lib::Quote(s.name) + ": ";
        if (dvswitches.Find(s.name)) checker.Fail(where + "a distributed switch has the same name");
        if (s.numPorts < 1 || s.numPorts > kMaxSwitchPorts)
            checker.Fail(where + std::to_string(s.numPorts) + " ports (1 to 4096)");
        if (s.usedPorts > s.numPorts) checker.Fail(where + "more ports in use than it has");
        if (s.mtu < kMinMtu || s.mtu > kMaxMtu)
            checker.Fail(where + "MTU " + std::to_string(s.mtu) + " (1280 to 9000)");
        hostPorts += s.numPorts;
        for (const auto& g : s.portGroups) {
            RequireName(g.name, checker, "port group name");
            if (g.vlanId > kMaxVlanId) {
                checker.Fail(where + "port group " + Lib::Quote(g.name) + " has VLAN ID " +
                             std::to_string(g.vlanId) + " (at most 4095)");
            }
            groups.push_back(g.name);
        }
        for (const auto& uplink : s.uplinks) {
            if (!pnics.Find(uplink))
                checker.Fail(where + "uplink " + Lib::Quote(uplink) + " is not a physical NIC");
            uplinks.push_back(uplink);
        }
    }
    for (const auto& d : dvswitches.switches) {
        uplinks.insert(uplinks.end(), d.uplinks.begin(), d.uplinks.end());
        hostPorts += d.numPorts;
    }
    if (hostPorts > kMaxHostPorts) {
        checker.Fail("the switches have " + std::to_string(hostPorts) + " ports together (at most 4608)");
    }
    RequireUnique(
        groups, [](const std::string& g) { return g; }, checker, "port group name");
    RequireUnique(
        uplinks, [](const std::string& u) { return u; }, checker, "uplink (a NIC on two switches)");
    // Teaming orders name uplinks of their own switch.
    for (const auto& s : section.switches) {
        std::string where = "switch " + Lib::Quote(s.name) + ": ";
        CheckTeaming(s.policy.teaming, s, where, checker);
        for (const auto& g : s.portGroups)
            CheckTeaming(g.policy.teaming, s, where + "port group " + Lib::Quote(g.name) + ": ", checker);
    }
}

}  // namespace

const Lib::SectionKind& VSwitchesSection::Kind() {
    static const Json::JsonSection<VSwitchesSection> kind("vswitches", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model

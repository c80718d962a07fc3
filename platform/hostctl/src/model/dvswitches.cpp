#include "model/dvswitches.h"

#include "model/pnics.h"
#include "model/values.h"
#include "model/vswitches.h"

namespace TknCtl::Model {

const DvPort* DvSwitch::FindPort(const std::string& id) const {
    for (const auto& port : ports) {
        if (port.id == id) return &port;
    }
    return nullptr;
}

DvPort* DvSwitch::FindPort(const std::string& id) {
    return const_cast<DvPort*>(static_cast<const DvSwitch*>(this)->FindPort(id));
}

const DvSwitch* DvSwitchesSection::Find(const std::string& name) const {
    for (const auto& s : switches) {
        if (s.name == name) return &s;
    }
    return nullptr;
}

DvSwitch* DvSwitchesSection::Find(const std::string& name) {
    return const_cast<DvSwitch*>(static_cast<const DvSwitchesSection*>(this)->Find(name));
}

const DvSwitch* DvSwitchesSection::FindByUuid(const std::string& uuid) const {
    for (const auto& s : switches) {
        if (s.uuid == uuid) return &s;
    }
    return nullptr;
}

namespace {

using Json::In;
using Json::Node;

LacpMember LoadMember(const In& in) {
    LacpMember m;
    m.nic = in.Str("nic");
    m.state = in.Str("state", "");
    if (auto a = in.OptMember("actor")) {
        m.actor.portNumber = a->Int<std::uint16_t>("portNumber", 0);
        m.actor.portPriority = a->Int<std::uint16_t>("portPriority", 0);
        m.actor.adminKey = a->Int<std::uint16_t>("adminKey", 0);
        m.actor.operKey = a->Int<std::uint16_t>("operKey", 0);
        m.actor.state = a->Int<std::uint8_t>("state", 0);
        m.actor.flags = a->Str("flags", "");
        a->Done();
    }
    if (auto p = in.OptMember("partner")) {
        m.partner.portNumber = p->Int<std::uint16_t>("portNumber", 0);
        m.partner.portPriority = p->Int<std::uint16_t>("portPriority", 0);
        m.partner.operKey = p->Int<std::uint16_t>("operKey", 0);
        m.partner.state = p->Int<std::uint8_t>("state", 0);
        m.partner.deviceId = p->Str("deviceId", "");
        m.partner.flags = p->Str("flags", "");
        p->Done();
    }
    m.age = in.Int<std::uint32_t>("age", 0);
    m.txLacpdus = in.Int<std::uint64_t>("txLacpdus", 0);
    m.txErrors = in.Int<std::uint64_t>("txErrors", 0);
    m.rxLacpdus = in.Int<std::uint64_t>("rxLacpdus", 0);
    m.rxErrors = in.Int<std::uint64_t>("rxErrors", 0);
    in.Done();
    return m;
}

Node SaveMember(const LacpMember& m) {
    return Node{{"nic", m.nic},
                {"state", m.state},
                {"actor",
                 {{"portNumber", m.actor.portNumber},
                  {"portPriority", m.actor.portPriority},
                  {"adminKey", m.actor.adminKey},
                  {"operKey", m.actor.operKey},
                  {"state", m.actor.state},
                  {"flags", m.actor.flags}}},
                {"partner",
                 {{"portNumber", m.partner.portNumber},
                  {"portPriority", m.partner.portPriority},
                  {"operKey", m.partner.operKey},
                  {"state", m.partner.state},
                  {"deviceId", m.partner.deviceId},
                  {"flags", m.partner.flags}}},
                {"age", m.age},
                {"txLacpdus", m.txLacpdus},
                {"txErrors", m.txErrors},
                {"rxLacpdus", m.rxLacpdus},
                {"rxErrors", m.rxErrors}};
}

LacpConfig LoadLacp(const In& in) {
    LacpConfig c;
    if (auto form = in.OptMember("form")) c.form = Json::NameToCode(*form, kLacpForms);
    in.Each("uplinks", [&](const In& item) {
        LacpUplink u;
        u.name = item.Str("name");
        u.nic = item.Str("nic", "");
        u.portId = item.Str("portId", "");
        item.Done();
        c.uplinks.push_back(std::move(u));
    });
    in.Each("lags", [&](const In& item) {
        Lag lag;
        lag.name = item.Str("name");
        lag.id = item.Int<std::uint32_t>("id");
        lag.uplinkCount = item.Int<std::uint32_t>("uplinkCount", 0);
        lag.mode = item.Int<std::uint32_t>("mode", 1);
        lag.loadBalancing = item.Int<std::uint32_t>("loadBalancing", 0);
        item.Done();
        c.lags.push_back(std::move(lag));
    });
    in.Each("status", [&](const In& item) {
        LagStatus status;
        status.lagId = item.Int<std::uint32_t>("lagId");
        status.mode = item.Int<std::uint32_t>("mode", 1);
        item.Each("members", [&](const In& member) { status.members.push_back(LoadMember(member)); });
        item.Done();
        c.status.push_back(std::move(status));
    });
    in.Done();
    return c;
}

Node SaveLacp(const LacpConfig& c) {
    Node uplinks = Node::array();
    for (const auto& u : c.uplinks)
        uplinks.push_back({{"name", u.name}, {"nic", u.nic}, {"portId", u.portId}});
    Node lags = Node::array();
    for (const auto& l : c.lags) {
        lags.push_back({{"name", l.name},
                        {"id", l.id},
                        {"uplinkCount", l.uplinkCount},
                        {"mode", l.mode},
                        {"loadBalancing", l.loadBalancing}});
    }
    Node status = Node::array();
    for (const auto& s : c.status) {
        Node members = Node::array();
        for (const auto& m : s.members)
            members.push_back(SaveMember(m));
        status.push_back({{"lagId", s.lagId}, {"mode", s.mode}, {"members", std::move(members)}});
    }
    return Node{{"form", kLacpForms[c.form < 3 ? c.form : 0]},
                {"uplinks", std::move(uplinks)},
                {"lags", std::move(lags)},
                {"status", std::move(status)}};
}

void Load(const In& in, DvSwitchesSection& section) {
    in.Elements([&](const In& item) {
        DvSwitch s;
        s.name = item.Str("name");
        s.uuid = item.Str("uuid");
        s.className = item.Str("className", s.className);
        s.numPorts = item.Int<std::uint32_t>("numPorts", 0);
        s.usedPorts = item.Int<std::uint32_t>("usedPorts", 0);
        s.configuredPorts = item.Int<std::uint32_t>("configuredPorts", 0);
        s.mtu = item.Int<std::uint32_t>("mtu", s.mtu);
        if (auto cdp = item.OptMember("cdpStatus")) s.cdpStatus = Json::NameToCode(*cdp, kCdpStatusNames);
        s.beaconTimeout = item.Int<std::int32_t>("beaconTimeout", -1);
        s.branded = item.Bool("branded", true);
        s.uplinks = item.Strings("uplinks");
        item.Each("ports", [&](const In& p) {
            DvPort port;
            port.id = p.Str("id");
            port.portgroupId = p.Str("portgroupId", "");
            port.inUse = p.Bool("inUse", false);
            port.clients = p.Strings("clients");
            port.connectionId = p.Int<std::uint32_t>("connectionId", 0);
            if (auto lacp = p.OptMember("lacp")) {
                port.lacp.enabled = lacp->Bool("enabled", false);
                port.lacp.mode = lacp->Int<std::uint32_t>("mode", 0);
                lacp->Done();
            }
            p.Done();
            s.ports.push_back(std::move(port));
        });
        if (auto lacp = item.OptMember("lacp")) s.lacp = LoadLacp(*lacp);
        item.Done();
        section.switches.push_back(std::move(s));
    });
}

Node Save(const DvSwitchesSection& section) {
    Node out = Node::array();
    for (const auto& s : section.switches) {
        Node ports = Node::array();
        for (const auto& p : s.ports) {
            ports.push_back({{"id", p.id},
                             {"portgroupId", p.portgroupId},
                             {"inUse", p.inUse},
                             {"clients", p.clients},
                             {"connectionId", p.connectionId},
                             {"lacp", {{"enabled", p.lacp.enabled}, {"mode", p.lacp.mode}}}});
        }
        out.push_back({{"name", s.name},
                       {"uuid", s.uuid},
                       {"className", s.className},
                       {"numPorts", s.numPorts},
                       {"usedPorts", s.usedPorts},
                       {"configuredPorts", s.configuredPorts},
                       {"mtu", s.mtu},
                       {"cdpStatus", kCdpStatusNames[s.cdpStatus < 4 ? s.cdpStatus : 3]},
                       {"beaconTimeout", s.beaconTimeout},
                       {"branded", s.branded},
                       {"uplinks", s.uplinks},
                       {"ports", std::move(ports)},
                       {"lacp", SaveLacp(s.lacp)}});
    }
    return out;
}

bool Contains(const std::vector<std::string>& names, const std::string& name) {
    for (const auto& n : names) {
        if (n == name) return true;
    }
    return false;
}

// LACP hangs together with the switch: LAG members are uplinks of the switch, a running LAG
// is a configured one and its members are configured members of it.
void CheckLacp(const DvSwitch& s, const std::string& where, Lib::Checker& checker) {
    const auto& lacp = s.lacp;
    for (const auto& u : lacp.uplinks) {
        if (!u.nic.empty() && !Contains(s.uplinks, u.nic)) {
            checker.Fail(where + "LACP uplink " + Lib::Quote(u.name) + " uses NIC " + Lib::Quote(u.nic) +
                         ", which is not an uplink of the switch");
        }
        if (lacp.form == kLacpSwitchWide && u.portId.empty()) {
            checker.Fail(where + "LACP uplink " + Lib::Quote(u.name) + " has no port");
        }
    }
    if (lacp.form != kLacpMultipleLag && !lacp.lags.empty()) {
        checker.Fail(where + "LAGs are configured but the LACP form is not \"multipleLag\"");
    }
    RequireUnique(
        lacp.status, [](const LagStatus& l) { return std::to_string(l.lagId); }, checker, "running LAG ID");
    for (const auto& running : lacp.status) {
        std::string lag = where + "running LAG " + std::to_string(running.lagId) + ": ";
        std::vector<std::string> members;
        if (lacp.form == kLacpMultipleLag) {
            const Lag* config = nullptr;
            for (const auto& l : lacp.lags) {
                if (l.id == running.lagId) config = &l;
            }
            if (!config) checker.Fail(lag + "no LAG of that ID is configured");
            for (std::uint32_t i = 0; i < config->uplinkCount; ++i) {
                for (const auto& u : lacp.uplinks) {
                    if (u.name == config->name + "-" + std::to_string(i)) members.push_back(u.nic);
                }
            }
        } else if (lacp.form == kLacpSwitchWide) {
            if (running.lagId != 0) checker.Fail(lag + "the switch-wide LAG has ID 0");
            for (const auto& u : lacp.uplinks)
                members.push_back(u.nic.empty() ? u.name : u.nic);
        } else {
            checker.Fail(lag + "LACP is not configured on the switch");
        }
        RequireUnique(
            running.members, [](const LacpMember& m) { return m.nic; }, checker, "LAG member NIC");
        for (const auto& m : running.members) {
            if (!Contains(members, m.nic)) {
                checker.Fail(lag + "member " + Lib::Quote(m.nic) + " is not a configured uplink of the LAG");
            }
        }
    }
}

void Check(const DvSwitchesSection& section, Lib::Checker& checker) {
    RequireUnique(
        section.switches, [](const DvSwitch& s) { return s.name; }, checker, "distributed switch name");
    RequireUnique(
        section.switches, [](const DvSwitch& s) { return s.uuid; }, checker, "distributed switch UUID");
    const auto& pnics = checker.Get<PnicsSection>();
    for (const auto& s : section.switches) {
        RequireName(s.name, checker, "distributed switch name");
        std::string where = "distributed switch " + Lib::Quote(s.name) + ": ";
        RequireUnique(
            s.ports, [](const DvPort& p) { return p.id; }, checker, "port ID");
        for (const auto& uplink : s.uplinks) {
            if (!pnics.Find(uplink))
                checker.Fail(where + "uplink " + Lib::Quote(uplink) + " is not a physical NIC");
        }
        RequireUnique(
            s.lacp.lags, [](const Lag& l) { return std::to_string(l.id); }, checker, "LAG ID");
        RequireUnique(
            s.lacp.lags, [](const Lag& l) { return l.name; }, checker, "LAG name");
        for (const auto& u : s.lacp.uplinks) {
            if (!u.portId.empty() && !s.FindPort(u.portId)) {
                checker.Fail(where + "LACP uplink " + Lib::Quote(u.name) + " uses unknown port " +
                             Lib::Quote(u.portId));
            }
            if (!u.nic.empty() && !pnics.Find(u.nic)) {
                checker.Fail(where + "LACP uplink " + Lib::Quote(u.name) + " names unknown NIC " +
                             Lib::Quote(u.nic));
            }
        }
        for (const auto& lag : s.lacp.lags) {
            if (lag.loadBalancing > 20) {
                checker.Fail(where + "LAG " + Lib::Quote(lag.name) + " has load-balancing code " +
                             std::to_string(lag.loadBalancing) + " (0-20)");
            }
        }
        CheckLacp(s, where, checker);
    }
}

}  // namespace

const Lib::SectionKind& DvSwitchesSection::Kind() {
    static const Json::JsonSection<DvSwitchesSection> kind("dvswitches", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model

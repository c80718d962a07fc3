// LACP on distributed switches: the configuration in its two forms, the state of the running
// LAGs, and the LACP timeout of their member NICs.
#include <algorithm>

#include "backend/host.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/dvs.h"
#include "model/dvswitches.h"

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;

namespace {

// The actor state bit of a member that wants fast (short-timeout) LACPDUs.
constexpr std::uint8_t kShortTimeoutBit = 0x02;

const Model::DvSwitch& FindSwitch(const std::string& name) {
    // The distributed switches of a real host are its area's (a plain Linux host has none).
    if (Lib::RealHost()) throw HostCtlException("Distributed switch " + name + " does not exist");
    const auto* dvs = Lib::Read<Model::DvSwitchesSection>().Find(name);
    if (!dvs) throw HostCtlException("Distributed switch " + name + " does not exist");
    return *dvs;
}

HostCtl::Network::DVPortParam PortParam(const Model::DvSwitch& dvs, const std::string& portId) {
    const auto* port = dvs.FindPort(portId);
    return {dvs.uuid, portId, port ? port->connectionId : 0};
}

// The NICs configured as members of a LAG: in the multiple-LAG form the NICs of the uplinks
// NAME-0 .. NAME-(count-1); in the switch-wide form (LAG 0) the uplinks whose port has LACP on.
std::vector<std::string> ConfiguredMembers(const Model::DvSwitch& dvs, std::int64_t lagId) {
    std::vector<std::string> nics;
    const auto& lacp = dvs.lacp;
    if (lacp.form == Model::kLacpMultipleLag) {
        for (const auto& lag : lacp.lags) {
            if (lag.id != lagId) continue;
            for (std::uint32_t i = 0; i < lag.uplinkCount; ++i) {
                std::string name = lag.name + "-" + std::to_string(i);
                for (const auto& uplink : lacp.uplinks) {
                    if (uplink.name == name && !uplink.nic.empty()) nics.push_back(uplink.nic);
                }
            }
        }
    } else if (lacp.form == Model::kLacpSwitchWide && lagId == 0) {
        for (const auto& uplink : lacp.uplinks) {
            const auto* port = dvs.FindPort(uplink.portId);
            if (port && port->lacp.enabled) nics.push_back(uplink.nic.empty() ? uplink.name : uplink.nic);
        }
    }
    return nics;
}

bool IsConfiguredLag(const Model::DvSwitch& dvs, std::int64_t lagId) {
    const auto& lacp = dvs.lacp;
    if (lacp.form == Model::kLacpMultipleLag) {
        return std::any_of(lacp.lags.begin(), lacp.lags.end(),
                           [&](const Model::Lag& lag) { return lag.id == lagId; });
    }
    return lacp.form == Model::kLacpSwitchWide && lagId == 0;
}

// The flags text with its timeout letter ('S' slow, 'F' fast) set to the new timeout.
std::string WithTimeoutLetter(std::string flags, bool shortTimeout) {
    const char letter = shortTimeout ? 'F' : 'S';
    auto pos = flags.find_first_of("SF");
    if (pos == std::string::npos) {
        flags.insert(flags.begin(), letter);
    } else {
        flags[pos] = letter;
    }
    return flags;
}

}  // namespace

HostCtl::Network::LacpConfig DVSwitchImpl::GetLacpConfig() const {
    Lib::Enter("HostCtl::Network::DVSwitch::GetLacpConfig", name_);
    const auto& dvs = FindSwitch(name_);
    HostCtl::Network::LacpConfig config;
    if (dvs.lacp.form == Model::kLacpNone) return config;  // LACP off: nothing configured
    config.multipleLag = dvs.lacp.form == Model::kLacpMultipleLag;
    for (const auto& uplink : dvs.lacp.uplinks) {
        config.uplinks.push_back({uplink.name, uplink.nic, PortParam(dvs, uplink.portId)});
    }
    if (config.multipleLag) {
        for (const auto& lag : dvs.lacp.lags) {
            config.lags.push_back({lag.name, lag.id, lag.uplinkCount, lag.mode, lag.loadBalancing});
        }
    }
    return config;
}

std::vector<HostCtl::Network::LacpStatus> DVSwitchImpl::GetLacpStatus() const {
    Lib::Enter("HostCtl::Network::DVSwitch::GetLacpStatus", name_);
    std::vector<HostCtl::Network::LacpStatus> out;
    for (const auto& lag : FindSwitch(name_).lacp.status) {
        HostCtl::Network::LacpStatus status;
        status.lagId = static_cast<std::int32_t>(lag.lagId);
        status.mode = lag.mode;
        for (const auto& m : lag.members) {
            HostCtl::Network::LacpMemberStatus member;
            member.nic = m.nic;
            member.state = m.state;
            member.actorPortNumber = m.actor.portNumber;
            member.actorPortPriority = m.actor.portPriority;
            member.actorAdminKey = m.actor.adminKey;
            member.actorOperKey = m.actor.operKey;
            member.actorState = m.actor.state;
            member.actorFlags = m.actor.flags;
            member.partnerPortNumber = m.partner.portNumber;
            member.partnerPortPriority = m.partner.portPriority;
            member.partnerOperKey = m.partner.operKey;
            member.partnerState = m.partner.state;
            member.partnerDeviceId = m.partner.deviceId;
            member.partnerFlags = m.partner.flags;
            member.age = m.age;
            member.txLacpdus = m.txLacpdus;
            member.txErrors = m.txErrors;
            member.rxLacpdus = m.rxLacpdus;
            member.rxErrors = m.rxErrors;
            status.members.push_back(std::move(member));
        }
        out.push_back(std::move(status));
    }
    return out;
}

void DVSwitchImpl::SetLacpTimeout(int lagId, bool shortTimeout, const std::string& nicName) {
    Lib::Enter("HostCtl::Network::DVSwitch::SetLacpTimeout", name_, Lib::Args(lagId, shortTimeout, nicName));
    // Check everything first: a refused request changes nothing.
    const auto& dvs = FindSwitch(name_);
    const auto& running = dvs.lacp.status;
    auto lag = std::find_if(running.begin(), running.end(), [&](const Model::LagStatus& s) {
        return lagId >= 0 && s.lagId == std::uint32_t(lagId);
    });
    if (lag == running.end() && !IsConfiguredLag(dvs, lagId)) {
        throw HostCtlException("Distributed switch " + name_ + " has no LAG with ID " +
                               std::to_string(lagId));
    }
    if (!nicName.empty()) {
        auto members = ConfiguredMembers(dvs, lagId);
        bool member = std::find(members.begin(), members.end(), nicName) != members.end();
        if (!member && lag != running.end()) {
            member = std::any_of(lag->members.begin(), lag->members.end(),
                                 [&](const Model::LacpMember& m) { return m.nic == nicName; });
        }
        if (!member) {
            throw HostCtlException("NIC " + nicName + " is not a member of LAG " + std::to_string(lagId) +
                                   " on distributed switch " + name_);
        }
    }
    if (lag == running.end()) return;  // configured but not running: no member state to change

    auto& status = Lib::Write<Model::DvSwitchesSection>().Find(name_)->lacp.status;
    for (auto& s : status) {
        if (s.lagId != std::uint32_t(lagId)) continue;
        for (auto& m : s.members) {
            if (!nicName.empty() && m.nic != nicName) continue;
            if (shortTimeout) {
                m.actor.state = static_cast<std::uint8_t>(m.actor.state | kShortTimeoutBit);
            } else {
                m.actor.state = static_cast<std::uint8_t>(m.actor.state & ~kShortTimeoutBit);
            }
            m.actor.flags = WithTimeoutLetter(m.actor.flags, shortTimeout);
        }
    }
}

}  // namespace TknCtl::Network

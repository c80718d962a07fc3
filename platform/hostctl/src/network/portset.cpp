// Switches as port sets, their ports, distributed ports and the information object over all
// switches.
#include <algorithm>

#include "backend/switches.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/dvs.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/vswitch.h"
#include "model/dvswitches.h"
#include "model/ports.h"
#include "model/tknnics.h"
#include "model/vswitches.h"
#include "network/internal.h"
#include "network/vswitch_model.h"

namespace HostCtl::Network {

Port::~Port() = default;
Portset::~Portset() = default;
DVPort::~DVPort() = default;
ConnectionPoint::~ConnectionPoint() = default;

}  // namespace HostCtl::Network

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;

namespace Internal {

std::string CdpStatusText(std::uint32_t code) {
    return code < std::size(Model::kCdpStatusNames) ? Model::kCdpStatusNames[code] : "unknown";
}

std::vector<std::unique_ptr<HostCtl::Network::Port>> PortsOfSwitch(const std::string& switchName) {
    std::vector<std::unique_ptr<HostCtl::Network::Port>> ports;
    for (const auto& port : Lib::Read<Model::PortsSection>().ports) {
        if (port.switchName == switchName) ports.push_back(std::make_unique<PortImpl>(port.id));
    }
    return ports;
}

// A standard switch answers as a port set through its own object (vswitch.cpp).
std::unique_ptr<HostCtl::Network::Portset> MakeStandardPortset(const std::string& name) {
    return std::make_unique<VirtualSwitchImpl>(name);
}

}  // namespace Internal

// ---------------------------------------------------------------- ports

namespace {
const Model::Port& FindPort(std::uint32_t id) {
    // A real host hands out no ports (VirtualSwitchImpl::GetPorts).
    if (VSwitchModel::RealSwitches())
        throw HostCtlException("Port " + std::to_string(id) + " does not exist");
    const auto* port = Lib::Read<Model::PortsSection>().Find(id);
    if (!port) throw HostCtlException("Port " + std::to_string(id) + " does not exist");
    return *port;
}

const Model::Port& EnterPort(const char* operation, std::uint32_t id) {
    Lib::Enter(std::string("HostCtl::Network::Port::") + operation, std::to_string(id));
    return FindPort(id);
}
}  // namespace

PortImpl::PortImpl(std::uint32_t portId) : portId_(portId) {}
PortImpl::~PortImpl() = default;

std::uint32_t PortImpl::GetPortId() const {
    Lib::Enter("HostCtl::Network::Port::GetPortId", std::to_string(portId_));
    return portId_;
}
std::uint32_t PortImpl::GetClientWorldId() const {
    return EnterPort("GetClientWorldId", portId_).worldId;
}
int PortImpl::GetPortType() const {
    return static_cast<int>(EnterPort("GetPortType", portId_).type);
}
std::string PortImpl::GetPortGroupName() const {
    return EnterPort("GetPortGroupName", portId_).portGroup;
}
std::string PortImpl::GetDVPortId() const {
    return EnterPort("GetDVPortId", portId_).dvPortId;
}
HostCtl::Network::MacAddress PortImpl::GetMacAddress() const {
    return EnterPort("GetMacAddress", portId_).mac;
}
HostCtl::Network::Ipv4Address PortImpl::GetIpAddress() const {
    return EnterPort("GetIpAddress", portId_).ipv4;
}
// A team uplink follows its switch: when the NIC recorded for the port is no longer an uplink
// of the switch, the port's traffic has failed over to the switch's first uplink (none left:
// no team uplink). A switch's own uplink ports have no team uplink.
std::string PortImpl::GetTeamUplink() const {
    const auto& port = EnterPort("GetTeamUplink", portId_);
    if (port.type == Model::kPortUplink || port.teamUplink.empty()) return {};
    const std::vector<std::string>* uplinks = nullptr;
    if (const auto* vswitch = Lib::Read<Model::VSwitchesSection>().Find(port.switchName)) {
        uplinks = &vswitch->uplinks;
    } else if (const auto* dvs = Lib::Read<Model::DvSwitchesSection>().Find(port.switchName)) {
        uplinks = &dvs->uplinks;
    }
    if (!uplinks || uplinks->empty()) return {};
    if (std::find(uplinks->begin(), uplinks->end(), port.teamUplink) != uplinks->end())
        return port.teamUplink;
    return uplinks->front();
}

HostCtl::Network::PacketStats PortImpl::GetPacketStats() const {
    const auto& stats = EnterPort("GetPacketStats", portId_).stats;
    HostCtl::Network::PacketStats out;
    out.packetsReceived = stats.rxPackets;
    out.packetsSent = stats.txPackets;
    out.broadcastReceived = stats.rxBroadcast;
    out.broadcastSent = stats.txBroadcast;
    out.multicastReceived = stats.rxMulticast;
    out.multicastSent = stats.txMulticast;
    out.droppedReceived = stats.rxDropped;
    out.droppedSent = stats.txDropped;
    return out;
}

HostCtl::Network::TrafficStats PortImpl::GetTrafficStats() const {
    const auto& stats = EnterPort("GetTrafficStats", portId_).stats;
    return {stats.rxBytes, stats.txBytes};
}

std::vector<std::unique_ptr<HostCtl::Network::FilterStats>> PortImpl::GetFilterStats() const {
    std::vector<std::unique_ptr<HostCtl::Network::FilterStats>> out;
    for (const auto& filter : EnterPort("GetFilterStats", portId_).filters) {
        auto stats = std::make_unique<HostCtl::Network::FilterStats>();
        stats->name = filter.name;
        stats->valid = filter.valid;
        stats->direction = filter.direction;
        stats->extendedValid = filter.extendedValid;
        stats->packetsIn = filter.packetsIn;
        stats->packetsOut = filter.packetsOut;
        stats->packetsDropped = filter.packetsDropped;
        stats->packetsFiltered = filter.packetsFiltered;
        stats->packetsFaulted = filter.packetsFaulted;
        stats->packetsQueued = filter.packetsQueued;
        stats->packetsInjected = filter.packetsInjected;
        stats->packetErrors = filter.packetErrors;
        out.push_back(std::move(stats));
    }
    return out;
}

// ---------------------------------------------------------------- distributed ports

namespace {
const Model::DvPort* LookupDvPort(const HostCtl::Network::DVPortParam& param, const Model::DvSwitch** owner) {
    // A real host's distributed switches have no ports this library serves (the area lists
    // none on a plain Linux host).
    if (VSwitchModel::RealSwitches()) {
        if (owner) *owner = nullptr;
        return nullptr;
    }
    const auto* dvs = Lib::Read<Model::DvSwitchesSection>().FindByUuid(param.GetSwitchUuid());
    if (owner) *owner = dvs;
    return dvs ? dvs->FindPort(param.GetPortId()) : nullptr;
}

const Model::DvPort& EnterDvPort(const char* operation, const HostCtl::Network::DVPortParam& param,
                                 const std::string& arguments = {}) {
    Lib::Enter(std::string("TknCtl::Network::DVPortImpl::") + operation, param.GetPortId(), arguments);
    const auto* port = LookupDvPort(param, nullptr);
    if (!port) {
        throw HostCtlException("Distributed port '" + param.GetPortId() + "' of switch '" +
                               param.GetSwitchUuid() + "' does not exist");
    }
    return *port;
}
}  // namespace

DVPortImpl::DVPortImpl(const HostCtl::Network::DVPortParam& param) : param_(param) {}
DVPortImpl::DVPortImpl(const std::string& switchUuid, const std::string& portId)
    : param_(switchUuid, portId, 0) {}
DVPortImpl::~DVPortImpl() = default;

std::string DVPortImpl::GetPortId() const {
    Lib::Enter("TknCtl::Network::DVPortImpl::GetPortId", param_.GetPortId());
    return param_.GetPortId();
}

std::string DVPortImpl::GetDVPortgroupId() const {
    return EnterDvPort("GetDVPortgroupId", param_).portgroupId;
}

bool DVPortImpl::GetInUse(std::vector<std::string>& clients) const {
    const auto& port = EnterDvPort("GetInUse", param_);
    clients.insert(clients.end(), port.clients.begin(), port.clients.end());
    return port.inUse;
}

HostCtl::Network::DVPortLacpState DVPortImpl::GetLacpState() const {
    const auto& port = EnterDvPort("GetLacpState", param_);
    return {port.lacp.enabled, port.lacp.mode};
}

std::string DVPortImpl::GetPortsetName() const {
    Lib::Enter("TknCtl::Network::DVPortImpl::GetPortsetName", param_.GetPortId());
    const Model::DvSwitch* owner = nullptr;
    LookupDvPort(param_, &owner);
    return owner ? owner->name : std::string();
}

bool DVPortImpl::IsValid() const {
    Lib::Enter("TknCtl::Network::DVPortImpl::IsValid", param_.GetPortId(), param_.GetSwitchUuid());
    return LookupDvPort(param_, nullptr) != nullptr;
}

int DVPortImpl::GetConnectionType() const {
    Lib::Enter("TknCtl::Network::DVPortImpl::GetConnectionType", param_.GetPortId());
    return TYPE_DVPORT;
}

std::string DVPortImpl::GetPortGroupName() const {
    Lib::Enter("TknCtl::Network::DVPortImpl::GetPortGroupName", param_.GetPortId());
    return {};
}

HostCtl::Network::DVPortParam DVPortImpl::GetDVPortParam() const {
    Lib::Enter("TknCtl::Network::DVPortImpl::GetDVPortParam", param_.GetPortId());
    return param_;
}

HostCtl::Network::OpaqueNetworkParam DVPortImpl::GetOpaqueNetworkParam() const {
    Lib::Enter("TknCtl::Network::DVPortImpl::GetOpaqueNetworkParam", param_.GetPortId());
    return {};
}

std::uint32_t DVPortImpl::GetConnectionId() const {
    return EnterDvPort("GetConnectionId", param_).connectionId;
}

void DVPortImpl::SetConnectionId(std::uint32_t connectionId) {
    // The port must exist before anything changes.
    EnterDvPort("SetConnectionId", param_, std::to_string(connectionId));
    for (auto& dvs : Lib::Write<Model::DvSwitchesSection>().switches) {
        if (dvs.uuid != param_.GetSwitchUuid()) continue;
        dvs.FindPort(param_.GetPortId())->connectionId = connectionId;
    }
    param_.SetConnectionId(connectionId);
}

// ---------------------------------------------------------------- all switches

bool PortsetImpl::IsValidVirtualSwitch(const std::string& name) {
    Lib::Enter("TknCtl::Network::PortsetImpl::IsValidVirtualSwitch", name);
    if (auto* real = VSwitchModel::RealSwitches()) return real->Has(name);
    return Lib::Read<Model::VSwitchesSection>().Find(name) != nullptr;
}

VirtualSwitchInfoImpl::VirtualSwitchInfoImpl() = default;
VirtualSwitchInfoImpl::~VirtualSwitchInfoImpl() = default;

std::vector<std::unique_ptr<HostCtl::Network::Portset>> VirtualSwitchInfoImpl::GetAllSwitches() {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::GetAllSwitches");
    std::vector<std::unique_ptr<HostCtl::Network::Portset>> switches;
    if (auto* real = VSwitchModel::RealSwitches()) {
        for (const auto& name : real->List())
            switches.push_back(Internal::MakeStandardPortset(name));
        for (const auto& name : real->DistributedSwitches())
            switches.push_back(std::make_unique<DVSwitchImpl>(name));
        return switches;
    }
    for (const auto& vswitch : Lib::Read<Model::VSwitchesSection>().switches) {
        switches.push_back(Internal::MakeStandardPortset(vswitch.name));
    }
    for (const auto& dvs : Lib::Read<Model::DvSwitchesSection>().switches) {
        switches.push_back(std::make_unique<DVSwitchImpl>(dvs.name));
    }
    return switches;
}

bool VirtualSwitchInfoImpl::IsLegacySwitch(const std::string& name) {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::IsLegacySwitch", name);
    if (auto* real = VSwitchModel::RealSwitches()) return real->Has(name);
    return Lib::Read<Model::VSwitchesSection>().Find(name) != nullptr;
}

bool VirtualSwitchInfoImpl::IsDVSwitch(const std::string& name) {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::IsDVSwitch", name);
    if (auto* real = VSwitchModel::RealSwitches()) {
        const auto names = real->DistributedSwitches();
        return std::find(names.begin(), names.end(), name) != names.end();
    }
    return Lib::Read<Model::DvSwitchesSection>().Find(name) != nullptr;
}

bool VirtualSwitchInfoImpl::IsOpaqueSwitch(const std::string& name) {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::IsOpaqueSwitch", name);
    // A real host has no opaque networks.
    if (VSwitchModel::RealSwitches()) return false;
    // Opaque switches are known only through the interfaces attached to their networks.
    const auto& nics = Lib::Read<Model::TknNicsSection>().nics;
    return std::any_of(nics.begin(), nics.end(), [&](const Model::TknNic& nic) {
        return nic.connection.type == Model::ConnectionPoint::kOpaque && nic.connection.portset == name;
    });
}

std::vector<std::unique_ptr<HostCtl::Network::DVSwitch>> VirtualSwitchInfoImpl::GetDVSwitches() {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::GetDVSwitches");
    std::vector<std::unique_ptr<HostCtl::Network::DVSwitch>> switches;
    if (auto* real = VSwitchModel::RealSwitches()) {
        for (const auto& name : real->DistributedSwitches())
            switches.push_back(std::make_unique<DVSwitchImpl>(name));
        return switches;
    }
    for (const auto& dvs : Lib::Read<Model::DvSwitchesSection>().switches) {
        switches.push_back(std::make_unique<DVSwitchImpl>(dvs.name));
    }
    return switches;
}

std::unique_ptr<HostCtl::Network::DVSwitch> VirtualSwitchInfoImpl::GetDVSwitchByName(
    const std::string& name) {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::GetDVSwitchByName", name);
    if (auto* real = VSwitchModel::RealSwitches()) {
        const auto names = real->DistributedSwitches();
        if (std::find(names.begin(), names.end(), name) == names.end()) return nullptr;
        return std::make_unique<DVSwitchImpl>(name);
    }
    if (!Lib::Read<Model::DvSwitchesSection>().Find(name)) return nullptr;
    return std::make_unique<DVSwitchImpl>(name);
}

}  // namespace TknCtl::Network

// Connection points of Tarkon interfaces: port groups, distributed ports and opaque networks,
// and taking a port of the switch behind one.
#include <algorithm>

#include "backend/host.h"
#include "backend/switches.h"
#include "core/hook.h"
#include "core/section.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "model/dvswitches.h"
#include "model/ports.h"
#include "model/vswitches.h"
#include "network/tknnic_internal.h"

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;
using HostCtl::Network::ConnectionPoint;

// ---------------------------------------------------------------- port groups

// The port group's own operations are in vswitch_portgroup.cpp.

std::string PortGroupImpl::GetPortsetName() const {
    Lib::Enter("TknCtl::Network::PortGroupImpl::GetPortsetName", name_);
    if (auto* host = Lib::RealHost()) {
        auto group = host->GetSwitches().FindPortGroup(name_);
        return group ? group->vswitch : std::string();
    }
    const auto* vswitch = Lib::Read<Model::VSwitchesSection>().FindPortGroupSwitch(name_);
    return vswitch ? vswitch->name : std::string();
}

bool PortGroupImpl::IsValid() const {
    Lib::Enter("TknCtl::Network::PortGroupImpl::IsValid", name_);
    if (auto* host = Lib::RealHost()) return host->GetSwitches().FindPortGroup(name_).has_value();
    return Lib::Read<Model::VSwitchesSection>().FindPortGroup(name_) != nullptr;
}

int PortGroupImpl::GetConnectionType() const {
    Lib::Enter("TknCtl::Network::PortGroupImpl::GetConnectionType", name_);
    return TYPE_PORTGROUP;
}

std::string PortGroupImpl::GetPortGroupName() const {
    Lib::Enter("TknCtl::Network::PortGroupImpl::GetPortGroupName", name_);
    return name_;
}

HostCtl::Network::DVPortParam PortGroupImpl::GetDVPortParam() const {
    Lib::Enter("TknCtl::Network::PortGroupImpl::GetDVPortParam", name_);
    return {};
}

HostCtl::Network::OpaqueNetworkParam PortGroupImpl::GetOpaqueNetworkParam() const {
    Lib::Enter("TknCtl::Network::PortGroupImpl::GetOpaqueNetworkParam", name_);
    return {};
}

// ---------------------------------------------------------------- opaque networks

OpaqueNetworkImpl::OpaqueNetworkImpl(const HostCtl::Network::OpaqueNetworkParam& param,
                                     const std::string& portsetName)
    : param_(param), portset_(portsetName) {}

OpaqueNetworkImpl::~OpaqueNetworkImpl() = default;

std::string OpaqueNetworkImpl::GetPortsetName() const {
    Lib::Enter("TknCtl::Network::OpaqueNetworkImpl::GetPortsetName", param_.GetNetworkId());
    return portset_;
}

bool OpaqueNetworkImpl::IsValid() const {
    Lib::Enter("TknCtl::Network::OpaqueNetworkImpl::IsValid", param_.GetNetworkId());
    if (Lib::RealHost()) return false;  // a real host has no opaque networks
    const auto& nics = Lib::Read<Model::TknNicsSection>().nics;
    return std::any_of(nics.begin(), nics.end(), [&](const Model::TknNic& nic) {
        return nic.connection.type == Model::ConnectionPoint::kOpaque &&
               nic.connection.opaque.GetNetworkId() == param_.GetNetworkId();
    });
}

int OpaqueNetworkImpl::GetConnectionType() const {
    Lib::Enter("TknCtl::Network::OpaqueNetworkImpl::GetConnectionType", param_.GetNetworkId());
    return TYPE_OPAQUE_NETWORK;
}

std::string OpaqueNetworkImpl::GetPortGroupName() const {
    Lib::Enter("TknCtl::Network::OpaqueNetworkImpl::GetPortGroupName", param_.GetNetworkId());
    return {};
}

HostCtl::Network::DVPortParam OpaqueNetworkImpl::GetDVPortParam() const {
    Lib::Enter("TknCtl::Network::OpaqueNetworkImpl::GetDVPortParam", param_.GetNetworkId());
    return {};
}

HostCtl::Network::OpaqueNetworkParam OpaqueNetworkImpl::GetOpaqueNetworkParam() const {
    Lib::Enter("TknCtl::Network::OpaqueNetworkImpl::GetOpaqueNetworkParam", param_.GetNetworkId());
    return param_;
}

// ---------------------------------------------------------------- the model's view

namespace Internal {

Model::ConnectionPoint ToModelConnection(const ConnectionPoint& point) {
    Model::ConnectionPoint out;
    switch (point.GetConnectionType()) {
        case ConnectionPoint::TYPE_PORTGROUP:
            out.type = Model::ConnectionPoint::kPortGroup;
            out.portGroup = point.GetPortGroupName();
            break;
        case ConnectionPoint::TYPE_DVPORT:
            out.type = Model::ConnectionPoint::kDvPort;
            out.dvPort = point.GetDVPortParam();
            break;
        case ConnectionPoint::TYPE_OPAQUE_NETWORK:
            out.type = Model::ConnectionPoint::kOpaque;
            out.opaque = point.GetOpaqueNetworkParam();
            out.portset = point.GetPortsetName();
            break;
        default:
            throw HostCtlException("Unknown connection point type " +
                                   std::to_string(point.GetConnectionType()));
    }
    return out;
}

std::unique_ptr<ConnectionPoint> MakeConnectionPoint(const Model::ConnectionPoint& point) {
    switch (point.type) {
        case Model::ConnectionPoint::kPortGroup:
            return std::make_unique<PortGroupImpl>(point.portGroup);
        case Model::ConnectionPoint::kDvPort:
            return std::make_unique<DVPortImpl>(point.dvPort);
        case Model::ConnectionPoint::kOpaque:
            return std::make_unique<OpaqueNetworkImpl>(point.opaque, point.portset);
        case Model::ConnectionPoint::kNone:
            break;
    }
    return nullptr;
}

bool SameConnection(const Model::ConnectionPoint& a, const Model::ConnectionPoint& b) {
    if (a.type != b.type) return false;
    switch (a.type) {
        case Model::ConnectionPoint::kPortGroup:
            return a.portGroup == b.portGroup;
        case Model::ConnectionPoint::kDvPort:
            return a.dvPort.GetSwitchUuid() == b.dvPort.GetSwitchUuid() &&
                   a.dvPort.GetPortId() == b.dvPort.GetPortId();
        case Model::ConnectionPoint::kOpaque:
            return a.opaque.GetNetworkId() == b.opaque.GetNetworkId() &&
                   a.opaque.GetExternalId() == b.opaque.GetExternalId();
        case Model::ConnectionPoint::kNone:
            break;
    }
    return false;
}

namespace {
const Model::DvSwitch* DvSwitchOf(const Model::ConnectionPoint& point) {
    return Lib::Read<Model::DvSwitchesSection>().FindByUuid(point.dvPort.GetSwitchUuid());
}
}  // namespace

std::string DescribeConnection(const Model::ConnectionPoint& point) {
    switch (point.type) {
        case Model::ConnectionPoint::kPortGroup:
            return "port group " + Lib::Quote(point.portGroup);
        case Model::ConnectionPoint::kDvPort: {
            const auto* dvs = DvSwitchOf(point);
            return "distributed port " + Lib::Quote(point.dvPort.GetPortId()) + " of " +
                   (dvs ? dvs->name : "switch " + Lib::Quote(point.dvPort.GetSwitchUuid()));
        }
        case Model::ConnectionPoint::kOpaque:
            return "opaque network " + Lib::Quote(point.opaque.GetNetworkId());
        case Model::ConnectionPoint::kNone:
            break;
    }
    return "no connection point";
}

std::string PortsetOf(const Model::ConnectionPoint& point) {
    switch (point.type) {
        case Model::ConnectionPoint::kPortGroup: {
            const auto* vswitch = Lib::Read<Model::VSwitchesSection>().FindPortGroupSwitch(point.portGroup);
            return vswitch ? vswitch->name : std::string();
        }
        case Model::ConnectionPoint::kDvPort: {
            const auto* dvs = DvSwitchOf(point);
            return dvs ? dvs->name : std::string();
        }
        case Model::ConnectionPoint::kOpaque:
            return point.portset;
        case Model::ConnectionPoint::kNone:
            break;
    }
    return {};
}

void CheckAttachable(const Model::ConnectionPoint& point) {
    for (const auto& nic : Lib::Read<Model::TknNicsSection>().nics) {
        if (SameConnection(nic.connection, point)) {
            throw HostCtlException("The " + DescribeConnection(point) +
                                   " already has a Tarkon network interface (" + nic.name + ")");
        }
    }
    switch (point.type) {
        case Model::ConnectionPoint::kPortGroup: {
            const auto* vswitch = Lib::Read<Model::VSwitchesSection>().FindPortGroupSwitch(point.portGroup);
            if (!vswitch)
                throw HostCtlException("Port group " + Lib::Quote(point.portGroup) + " does not exist");
            if (vswitch->usedPorts >= vswitch->numPorts) {
                throw HostCtlException("Virtual switch " + vswitch->name + " has no free port (" +
                                       std::to_string(vswitch->numPorts) + " ports, all in use)");
            }
            return;
        }
        case Model::ConnectionPoint::kDvPort: {
            const auto* dvs = DvSwitchOf(point);
            if (!dvs) {
                throw HostCtlException("No distributed switch with UUID " +
                                       Lib::Quote(point.dvPort.GetSwitchUuid()));
            }
            const auto* port = dvs->FindPort(point.dvPort.GetPortId());
            if (!port) {
                throw HostCtlException("Distributed switch " + dvs->name + " has no port " +
                                       Lib::Quote(point.dvPort.GetPortId()));
            }
            if (port->inUse || !port->clients.empty()) {
                std::string clients;
                for (const auto& client : port->clients)
                    clients += (clients.empty() ? "" : ", ") + client;
                throw HostCtlException("The " + DescribeConnection(point) + " is in use" +
                                       (clients.empty() ? std::string() : " by " + clients));
            }
            if (dvs->usedPorts >= dvs->numPorts) {
                throw HostCtlException("Distributed switch " + dvs->name + " has no free port");
            }
            return;
        }
        case Model::ConnectionPoint::kOpaque:
            throw HostCtlException("The " + DescribeConnection(point) + " is not available on this host");
        case Model::ConnectionPoint::kNone:
            break;
    }
    throw HostCtlException("A Tarkon network interface needs a connection point");
}

namespace {

// The next port ID of a switch: one above the highest ID of its ports; a switch without
// ports starts a block of its own.
std::uint32_t NextPortId(const std::string& switchName) {
    const auto& ports = Lib::Read<Model::PortsSection>().ports;
    std::uint32_t highest = 0;
    std::uint32_t highestBlock = 0;
    for (const auto& port : ports) {
        if (port.switchName == switchName) highest = std::max(highest, port.id);
        highestBlock = std::max(highestBlock, port.id >> 24);
    }
    std::uint32_t id = highest != 0 ? highest + 1 : ((highestBlock + 1) << 24) + 2;
    while (Lib::Read<Model::PortsSection>().Find(id))
        ++id;
    return id;
}

}  // namespace

std::uint32_t Attach(Model::TknNic& nic) {
    Model::Port port;
    port.switchName = PortsetOf(nic.connection);
    port.type = Model::kPortTknNic;
    port.client = nic.name;
    port.mac = nic.mac;
    port.ipv4 = nic.ipConfig.GetIpv4Address();
    if (nic.connection.type == Model::ConnectionPoint::kPortGroup) {
        auto* vswitch = Lib::Write<Model::VSwitchesSection>().Find(port.switchName);
        ++vswitch->usedPorts;
        for (auto& group : vswitch->portGroups) {
            if (group.name == nic.connection.portGroup) ++group.activeClients;
        }
        port.portGroup = nic.connection.portGroup;
        if (!vswitch->uplinks.empty()) port.teamUplink = vswitch->uplinks.front();
    } else {
        auto* dvs = Lib::Write<Model::DvSwitchesSection>().Find(port.switchName);
        ++dvs->usedPorts;
        auto* dvPort = dvs->FindPort(nic.connection.dvPort.GetPortId());
        dvPort->inUse = true;
        dvPort->clients = {nic.name};
        if (nic.connection.dvPort.GetConnectionId() != 0) {
            dvPort->connectionId = nic.connection.dvPort.GetConnectionId();
        } else {
            nic.connection.dvPort.SetConnectionId(dvPort->connectionId);
        }
        port.dvPortId = dvPort->id;
        if (!dvs->uplinks.empty()) port.teamUplink = dvs->uplinks.front();
    }
    port.id = NextPortId(port.switchName);
    Lib::Write<Model::PortsSection>().ports.push_back(port);
    return port.id;
}

}  // namespace Internal
}  // namespace TknCtl::Network

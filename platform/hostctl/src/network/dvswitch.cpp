// Distributed switches.
#include "backend/host.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/dvs.h"
#include "model/dvswitches.h"
#include "network/internal.h"

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;

namespace {
const Model::DvSwitch& EnterSwitch(const char* operation, const std::string& name, const std::string& arguments = {}) {
    Lib::Enter(std::string("HostCtl::Network::DVSwitch::") + operation, name, arguments);
    // The distributed switches of a real host are its area's (a plain Linux host has none).
    if (Lib::RealHost()) throw HostCtlException("Distributed switch " + name + " does not exist");
    const auto* dvs = Lib::Read<Model::DvSwitchesSection>().Find(name);
    if (!dvs) throw HostCtlException("Distributed switch " + name + " does not exist");
    return *dvs;
}
}  // namespace

DVSwitchImpl::DVSwitchImpl(std::string name) : name_(std::move(name)) {}
DVSwitchImpl::~DVSwitchImpl() = default;

std::string DVSwitchImpl::GetName() const { return EnterSwitch("GetName", name_).name; }
std::string DVSwitchImpl::GetClassName() const { return EnterSwitch("GetClassName", name_).className; }
std::uint32_t DVSwitchImpl::GetNumPorts() const { return EnterSwitch("GetNumPorts", name_).numPorts; }
std::uint32_t DVSwitchImpl::GetNumUsedPorts() const { return EnterSwitch("GetNumUsedPorts", name_).usedPorts; }
std::uint32_t DVSwitchImpl::GetNumConfiguredPorts() const {
    return EnterSwitch("GetNumConfiguredPorts", name_).configuredPorts;
}
int DVSwitchImpl::GetMtu() const { return static_cast<int>(EnterSwitch("GetMtu", name_).mtu); }
std::string DVSwitchImpl::GetCdpStatus() const {
    return Internal::CdpStatusText(EnterSwitch("GetCdpStatus", name_).cdpStatus);
}
std::vector<std::string> DVSwitchImpl::GetUplinkNames() const { return EnterSwitch("GetUplinkNames", name_).uplinks; }

std::vector<std::unique_ptr<HostCtl::Network::Port>> DVSwitchImpl::GetPorts() const {
    EnterSwitch("GetPorts", name_);
    return Internal::PortsOfSwitch(name_);
}

std::vector<HostCtl::Network::VlanStats> DVSwitchImpl::GetVlanStats(const std::string& uplink) const {
    EnterSwitch("GetVlanStats", name_, uplink);
    return Internal::UplinkVlanStats(name_, uplink);
}

void DVSwitchImpl::SetVlanStatsEnabled(const std::string& uplink, bool enabled) {
    EnterSwitch("SetVlanStatsEnabled", name_, Lib::Args(uplink, enabled));
    Internal::SetUplinkVlanStatsEnabled(name_, uplink, enabled);
}

std::string DVSwitchImpl::GetDvsName() const { return EnterSwitch("GetDvsName", name_).name; }
std::string DVSwitchImpl::GetUuid() const { return EnterSwitch("GetUuid", name_).uuid; }
std::int32_t DVSwitchImpl::GetBeaconTimeout() const { return EnterSwitch("GetBeaconTimeout", name_).beaconTimeout; }
bool DVSwitchImpl::IsBranded() const { return EnterSwitch("IsBranded", name_).branded; }

std::vector<std::unique_ptr<HostCtl::Network::DVPort>> DVSwitchImpl::GetDVPorts() const {
    const auto& dvs = EnterSwitch("GetDVPorts", name_);
    std::vector<std::unique_ptr<HostCtl::Network::DVPort>> ports;
    for (const auto& port : dvs.ports) ports.push_back(std::make_unique<DVPortImpl>(dvs.uuid, port.id));
    return ports;
}

}  // namespace TknCtl::Network

// Standard virtual switches and port groups.
#include "core/hook.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/vswitch.h"

namespace HostCtl::Network {

PortGroup::~PortGroup() = default;

std::unique_ptr<PortGroup> NetworkFactory::GetPortGroupByName(std::string name) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkFactory::GetPortGroupByName", name);
    throw Lib::HostCtlException("Port groups are not available");
}

std::unique_ptr<VirtualSwitch> NetworkFactory::GetVirtualSwitchById(std::string name) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkFactory::GetVirtualSwitchById", name);
    throw Lib::HostCtlException("Virtual switches are not available");
}

}  // namespace HostCtl::Network

namespace TknCtl::Network {

std::vector<std::unique_ptr<HostCtl::Network::PortGroup>> NetworkInfoImpl::GetAllPortGroups() {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetAllPortGroups");
    throw HostCtl::Lib::HostCtlException("Port groups are not available");
}

std::unique_ptr<HostCtl::Network::VirtualSwitch> VirtualSwitchInfoImpl::AddVirtualSwitchWithPolicy(
    const HostCtl::Network::NicTeamingPolicy&, const HostCtl::Network::PortSecurityPolicy&,
    const HostCtl::Network::ShapingPolicy&, const HostCtl::Network::NicCapabilities&, const std::string& name,
    std::uint32_t numPorts) {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::AddVirtualSwitchWithPolicy", name, Lib::Args(numPorts));
    throw HostCtl::Lib::HostCtlException("Virtual switches are not available");
}

std::unique_ptr<HostCtl::Network::VirtualSwitch> VirtualSwitchInfoImpl::GetVirtualSwitchByName(const std::string& name) {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::GetVirtualSwitchByName", name);
    throw HostCtl::Lib::HostCtlException("Virtual switches are not available");
}

std::vector<std::unique_ptr<HostCtl::Network::VirtualSwitch>> VirtualSwitchInfoImpl::GetVirtualSwitches() {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::GetVirtualSwitches");
    throw HostCtl::Lib::HostCtlException("Virtual switches are not available");
}

void VirtualSwitchInfoImpl::RemoveVirtualSwitch(const std::string& name) {
    Lib::Enter("TknCtl::Network::VirtualSwitchInfoImpl::RemoveVirtualSwitch", name);
    throw HostCtl::Lib::HostCtlException("Virtual switches are not available");
}

}  // namespace TknCtl::Network

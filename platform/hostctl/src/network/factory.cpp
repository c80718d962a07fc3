// The host, its factories and the network information object.
#include "backend/host.h"
#include "backend/netstacks.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/dvs.h"
#include "hostctl/network/network_info.h"
#include "model/dvswitches.h"
#include "model/netstacks.h"

namespace HostCtl::Network {

NetworkInfo::~NetworkInfo() = default;

std::unique_ptr<NetworkInfo> NetworkFactory::GetNetworkInfo() {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkFactory::GetNetworkInfo");
    return std::make_unique<TknCtl::Network::NetworkInfoImpl>();
}

std::unique_ptr<DVSwitch> NetworkFactory::GetDVSwitchByName(std::string name) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkFactory::GetDVSwitchByName", name);
    if (TknCtl::Lib::RealHost()) return TknCtl::Network::VirtualSwitchInfoImpl().GetDVSwitchByName(name);
    if (!TknCtl::Lib::Read<TknCtl::Model::DvSwitchesSection>().Find(name)) return nullptr;
    return std::make_unique<TknCtl::Network::DVSwitchImpl>(name);
}

std::unique_ptr<DVPort> NetworkFactory::GetDVPort(const DVPortParam& param) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkFactory::GetDVPort", param.GetPortId(), param.GetSwitchUuid());
    if (TknCtl::Lib::RealHost())
        throw Lib::HostCtlException("No distributed switch with UUID '" + param.GetSwitchUuid() + "'");
    const auto* dvs = TknCtl::Lib::Read<TknCtl::Model::DvSwitchesSection>().FindByUuid(param.GetSwitchUuid());
    if (!dvs) throw Lib::HostCtlException("No distributed switch with UUID '" + param.GetSwitchUuid() + "'");
    if (!dvs->FindPort(param.GetPortId())) {
        throw Lib::HostCtlException("Distributed switch " + dvs->name + " has no port '" + param.GetPortId() + "'");
    }
    return std::make_unique<TknCtl::Network::DVPortImpl>(param);
}

}  // namespace HostCtl::Network

namespace HostCtl {

Host::~Host() = default;

std::unique_ptr<Network::NetworkInfo> Host::GetNetworkInfo() {
    TknCtl::Lib::Enter("HostCtl::Host::GetNetworkInfo");
    return std::make_unique<TknCtl::Network::NetworkInfoImpl>();
}

std::unique_ptr<Host> HostFactory::GetHost() {
    TknCtl::Lib::Enter("HostCtl::HostFactory::GetHost");
    return std::make_unique<Host>();
}

}  // namespace HostCtl

namespace TknCtl::Network {

NetworkInfoImpl::NetworkInfoImpl() = default;
NetworkInfoImpl::~NetworkInfoImpl() = default;

std::uint32_t NetworkInfoImpl::GetNetstackInstanceState(const std::string& key) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetNetstackInstanceState", key);
    if (auto* host = Lib::RealHost()) {
        if (auto entry = host->GetNetstacks().Find(key))
            return entry->enabled ? Model::kNetstackEnabled : Model::kNetstackConfigured;
    } else if (const auto* netstack = Lib::Read<Model::NetstacksSection>().Find(key)) {
        return netstack->state;
    }
    // The dedicated netstacks are known to the host before their first interface creates them.
    if (key == "glidex" || key == "faultTolerance" || key == "PellixProvisioning")
        return Model::kNetstackConfigured;
    throw HostCtl::Lib::HostCtlException("Netstack instance '" + key + "' does not exist");
}

}  // namespace TknCtl::Network

// Physical NICs.
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/dvs.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"
#include "model/pnics.h"
#include "model/ports.h"

namespace HostCtl::Network {
Pnic::~Pnic() = default;
}  // namespace HostCtl::Network

namespace TknCtl::Network {

PnicImpl::PnicImpl(std::string name) : name_(std::move(name)) {}
PnicImpl::~PnicImpl() = default;

bool PnicImpl::IsValidPnic(const std::string& name) {
    Lib::Enter("TknCtl::Network::PnicImpl::IsValidPnic", name);
    return Lib::Read<Model::PnicsSection>().Find(name) != nullptr;
}

std::string PnicImpl::GetName() const {
    Lib::Enter("HostCtl::Network::Pnic::GetName", name_);
    return name_;
}

std::unique_ptr<HostCtl::Network::Port> PnicImpl::GetPort() const {
    Lib::Enter("TknCtl::Network::PnicImpl::GetPort", name_);
    for (const auto& port : Lib::Read<Model::PortsSection>().ports) {
        if (port.type == Model::kPortUplink && port.client == name_) return std::make_unique<PortImpl>(port.id);
    }
    return nullptr;
}

std::vector<std::unique_ptr<HostCtl::Network::Pnic>> NetworkInfoImpl::GetPnics() {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetPnics");
    std::vector<std::unique_ptr<HostCtl::Network::Pnic>> nics;
    for (const auto& nic : Lib::Read<Model::PnicsSection>().nics) nics.push_back(std::make_unique<PnicImpl>(nic.name));
    return nics;
}

std::unique_ptr<HostCtl::Network::Pnic> NetworkInfoImpl::GetPnicByName(const std::string& name) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetPnicByName", name);
    if (!Lib::Read<Model::PnicsSection>().Find(name)) return nullptr;
    return std::make_unique<PnicImpl>(name);
}

}  // namespace TknCtl::Network

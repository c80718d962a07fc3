// SR-IOV physical functions and their virtual functions.
#include "core/hook.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TknCtl::Network {

std::vector<std::unique_ptr<HostCtl::Network::Pnic>> NetworkInfoImpl::GetSriovNics() {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetSriovNics");
    throw HostCtl::Lib::HostCtlException("SR-IOV is not available");
}

std::unique_ptr<HostCtl::Network::Pnic> NetworkInfoImpl::GetSriovNicByName(const std::string& name) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetSriovNicByName", name);
    throw HostCtl::Lib::HostCtlException("SR-IOV is not available");
}

std::vector<HostCtl::Network::SriovNicVFInfo> NetworkInfoImpl::GetSriovNicVFInfo(const std::string& name) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetSriovNicVFInfo", name);
    throw HostCtl::Lib::HostCtlException("SR-IOV is not available");
}

void NetworkInfoImpl::GetSriovNicVFStats(HostCtl::Network::SriovNicVFStats*, const std::string& name,
                                         std::uint8_t vfId) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetSriovNicVFStats", name, Lib::Args(vfId));
    throw HostCtl::Lib::HostCtlException("SR-IOV is not available");
}

}  // namespace TknCtl::Network

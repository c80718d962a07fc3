// ENS contexts.
#include "core/hook.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"

namespace HostCtl::Network {

namespace {
[[noreturn]] void Unavailable() { throw Lib::HostCtlException("ENS is not available"); }
}  // namespace

std::uint64_t NetworkInfo::GetMaxLcores() {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkInfo::GetMaxLcores");
    Unavailable();
}
bool NetworkInfo::SetMaxLcores(unsigned long maxLcores) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkInfo::SetMaxLcores", {}, TknCtl::Lib::Args(maxLcores));
    Unavailable();
}
bool NetworkInfo::AddLcore(unsigned long lcoreId) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkInfo::AddLcore", {}, TknCtl::Lib::Args(lcoreId));
    Unavailable();
}
bool NetworkInfo::RemoveLcore(unsigned long lcoreId) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkInfo::RemoveLcore", {}, TknCtl::Lib::Args(lcoreId));
    Unavailable();
}
std::vector<std::uint64_t> NetworkInfo::GetLcoreList() {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkInfo::GetLcoreList");
    Unavailable();
}
std::string NetworkInfo::GetLcoreSwitch(unsigned long lcoreId) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkInfo::GetLcoreSwitch", {}, TknCtl::Lib::Args(lcoreId));
    Unavailable();
}
bool NetworkInfo::AddLcoreSwitch(const std::string& switchName, unsigned long lcoreId) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkInfo::AddLcoreSwitch", {}, TknCtl::Lib::Args(switchName, lcoreId));
    Unavailable();
}
std::uint32_t NetworkInfo::GetLcoreAffinity(unsigned long lcoreId) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkInfo::GetLcoreAffinity", {}, TknCtl::Lib::Args(lcoreId));
    Unavailable();
}
bool NetworkInfo::SetLcoreAffinity(unsigned int numaNode, unsigned long lcoreId) {
    TknCtl::Lib::Enter("HostCtl::Network::NetworkInfo::SetLcoreAffinity", {},
                       TknCtl::Lib::Args(numaNode, lcoreId));
    Unavailable();
}

}  // namespace HostCtl::Network

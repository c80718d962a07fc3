// A Tarkon interface.
#include <algorithm>

#include "backend/host.h"
#include "core/hook.h"
#include "core/section.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "hostctl/network/dvs.h"
#include "model/multicast.h"
#include "network/tknnic_internal.h"

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;
using HostCtl::Network::TknNicTagType;

namespace {

// A tag as the journal shows it: its name, or its number when it has none.
std::string TagArg(TknNicTagType tag) {
    std::string name = TknNicTagIdToName(tag);
    return name.empty() ? std::to_string(tag) : name;
}

}  // namespace

namespace Internal {

void CheckTagType(TknNicTagType tag) {
    if (!Model::TagName(tag)) {
        throw HostCtlException("Invalid interface tag type " + std::to_string(tag) + ": it must be between " +
                               std::to_string(HostCtl::Network::TKNNIC_TAG_FIRST) + " and " +
                               std::to_string(HostCtl::Network::TKNNIC_TAG_LAST));
    }
}

void CheckMtu(int mtu) {
    using HostCtl::Network::TknNic;
    if (mtu < TknNic::MIN_MTU || mtu > TknNic::MAX_MTU) {
        throw HostCtlException("Invalid MTU " + std::to_string(mtu) + ": it must be between " +
                               std::to_string(TknNic::MIN_MTU) + " and " + std::to_string(TknNic::MAX_MTU));
    }
}

const Model::TknNic& FindTknNic(const std::string& name) {
    const auto* nic = Lib::Read<Model::TknNicsSection>().Find(name);
    if (!nic) throw HostCtlException("Tarkon network interface " + Lib::Quote(name) + " does not exist");
    return *nic;
}

Model::TknNic& FindTknNicForWrite(const std::string& name) {
    FindTknNic(name);
    return *Lib::Write<Model::TknNicsSection>().Find(name);
}

}  // namespace Internal

TknNicImpl::TknNicImpl(std::string name) : name_(std::move(name)) {}
TknNicImpl::~TknNicImpl() = default;

const Model::TknNic& TknNicImpl::Enter(const char* operation, const std::string& arguments) const {
    Lib::Enter(std::string("HostCtl::Network::TknNic::") + operation, name_, arguments);
    return Internal::FindTknNic(name_);
}

std::string TknNicImpl::GetName() const {
    return Enter("GetName").name;
}
std::string TknNicImpl::GetNetstackInstance() const {
    return Enter("GetNetstackInstance").netstack;
}
HostCtl::Network::MacAddress TknNicImpl::GetMacAddress() const {
    return Enter("GetMacAddress").mac;
}
int TknNicImpl::GetMtu() const {
    return static_cast<int>(Enter("GetMtu").mtu);
}
int TknNicImpl::GetTsoMss() const {
    return static_cast<int>(Enter("GetTsoMss").tsoMss);
}
int TknNicImpl::GetRxDispQueueSize() const {
    return static_cast<int>(Enter("GetRxDispQueueSize").rxDispQueues);
}
bool TknNicImpl::IsEnabled() const {
    return Enter("IsEnabled").enabled;
}

void TknNicImpl::SetMtu(int mtu) {
    Enter("SetMtu", std::to_string(mtu));
    Internal::CheckMtu(mtu);
    Internal::FindTknNicForWrite(name_).mtu = static_cast<std::uint32_t>(mtu);
}

void TknNicImpl::Enable() {
    if (!Enter("Enable").enabled) Internal::FindTknNicForWrite(name_).enabled = true;
}

void TknNicImpl::Disable() {
    if (Enter("Disable").enabled) Internal::FindTknNicForWrite(name_).enabled = false;
}

HostCtl::Network::IpConfig TknNicImpl::GetIpConfig() const {
    return Enter("GetIpConfig").ipConfig;
}

HostCtl::Network::IpConfig TknNicImpl::GetDnsIpConfig() const {
    HostCtl::Network::IpConfig config = Enter("GetDnsIpConfig").ipConfig;
    if (!config.GetUseDhcp()) config.SetDhcpDns(false);
    if (!config.GetUseIpv6Dhcp() && !config.GetUseIpv6RouterAdvertised()) config.SetIpv6DhcpDns(false);
    return config;
}

void TknNicImpl::SetIpConfig(const HostCtl::Network::IpConfig& config) {
    const auto& nic = Enter("SetIpConfig");
    HostCtl::Network::IpConfig checked = Internal::CheckedIpConfig(nic, &nic.ipConfig, config);
    if (checked == nic.ipConfig) return;
    Internal::FindTknNicForWrite(name_).ipConfig = std::move(checked);
    Internal::SyncTknNic(name_);
}

std::unique_ptr<HostCtl::Network::ConnectionPoint> TknNicImpl::GetConnectionPoint() const {
    return Internal::MakeConnectionPoint(Enter("GetConnectionPoint").connection);
}

std::unique_ptr<HostCtl::Network::Port> TknNicImpl::GetPort() const {
    const auto& nic = Enter("GetPort");
    if (!nic.portId) return nullptr;
    return std::make_unique<PortImpl>(*nic.portId);
}

void TknNicImpl::AddTag(TknNicTagType tag, bool exclusive) {
    const auto& nic = Enter("AddTag", Lib::Args(TagArg(tag), exclusive));
    Internal::CheckTagType(tag);
    bool carries = std::find(nic.tags.begin(), nic.tags.end(), tag) != nic.tags.end();
    bool elsewhere = false;
    if (exclusive) {
        for (const auto& other : Lib::Read<Model::TknNicsSection>().nics) {
            if (other.name != name_ &&
                std::find(other.tags.begin(), other.tags.end(), tag) != other.tags.end())
                elsewhere = true;
        }
    }
    if (carries && !elsewhere) return;
    for (auto& other : Lib::Write<Model::TknNicsSection>().nics) {
        if (other.name == name_) {
            if (!carries) other.tags.push_back(tag);
        } else if (exclusive) {
            other.tags.erase(std::remove(other.tags.begin(), other.tags.end(), tag), other.tags.end());
        }
    }
}

void TknNicImpl::RemoveTag(TknNicTagType tag) {
    const auto& nic = Enter("RemoveTag", TagArg(tag));
    Internal::CheckTagType(tag);
    if (std::find(nic.tags.begin(), nic.tags.end(), tag) == nic.tags.end()) {
        throw HostCtlException("Tarkon network interface " + name_ + " does not carry the tag " +
                               TknNicTagIdToName(tag));
    }
    auto& tags = Internal::FindTknNicForWrite(name_).tags;
    tags.erase(std::remove(tags.begin(), tags.end(), tag), tags.end());
}

void TknNicImpl::GetTags(std::vector<TknNicTagType>& tags) const {
    const auto& nic = Enter("GetTags");
    tags.insert(tags.end(), nic.tags.begin(), nic.tags.end());
}

void TknNicImpl::GetMulticastGroups(std::vector<MulticastGroup>& groups) const {
    Enter("GetMulticastGroups");
    for (const auto& m : Lib::Read<Model::MulticastSection>().memberships) {
        if (m.interface == name_) groups.push_back({m.interface, m.group, m.linkLayer, m.refCount});
    }
}

void TknNicImpl::Remove() {
    Enter("Remove");
    Internal::RemoveTknNic(name_);
}

void TknNicImpl::Refresh() {
    Enter("Refresh");
    Internal::SyncTknNic(name_);
    SetStale(false);
}

// ---------------------------------------------------------------- an interface of a real host

RealTknNic::RealTknNic(Backend::InterfaceId id) : id_(std::move(id)) {}
RealTknNic::~RealTknNic() = default;

Backend::Interfaces& RealTknNic::Enter(const char* operation, const std::string& arguments) const {
    Lib::Enter(std::string("HostCtl::Network::TknNic::") + operation, id_.name, arguments);
    auto* host = Lib::RealHost();
    if (!host) throw HostCtlException("The interface " + id_.name + " belongs to a host no longer managed");
    return host->GetInterfaces();
}

std::string RealTknNic::GetName() const {
    Enter("GetName").GetLink(id_);  // throws once the interface is gone
    return id_.name;
}

std::string RealTknNic::GetNetstackInstance() const {
    Enter("GetNetstackInstance").GetLink(id_);
    return id_.netstack;
}

HostCtl::Network::MacAddress RealTknNic::GetMacAddress() const {
    return Enter("GetMacAddress").GetLink(id_).mac;
}

int RealTknNic::GetMtu() const {
    return Enter("GetMtu").GetLink(id_).mtu;
}

void RealTknNic::SetMtu(int mtu) {
    auto& area = Enter("SetMtu", std::to_string(mtu));
    Internal::CheckMtu(mtu);
    area.SetMtu(id_, mtu);
}

int RealTknNic::GetTsoMss() const {
    return Enter("GetTsoMss").GetLink(id_).tsoMss;
}

int RealTknNic::GetRxDispQueueSize() const {
    return Enter("GetRxDispQueueSize").GetLink(id_).rxQueues;
}

bool RealTknNic::IsEnabled() const {
    return Enter("IsEnabled").GetLink(id_).enabled;
}

void RealTknNic::Enable() {
    Enter("Enable").SetEnabled(id_, true);
}

void RealTknNic::Disable() {
    Enter("Disable").SetEnabled(id_, false);
}

HostCtl::Network::IpConfig RealTknNic::GetIpConfig() const {
    return Enter("GetIpConfig").GetIpConfig(id_);
}

HostCtl::Network::IpConfig RealTknNic::GetDnsIpConfig() const {
    HostCtl::Network::IpConfig config = Enter("GetDnsIpConfig").GetIpConfig(id_);
    if (!config.GetUseDhcp()) config.SetDhcpDns(false);
    if (!config.GetUseIpv6Dhcp() && !config.GetUseIpv6RouterAdvertised()) config.SetIpv6DhcpDns(false);
    return config;
}

void RealTknNic::SetIpConfig(const HostCtl::Network::IpConfig& wanted) {
    auto& area = Enter("SetIpConfig");
    const HostCtl::Network::IpConfig current = area.GetIpConfig(id_);
    HostCtl::Network::IpConfig config = wanted;
    if (config.GetUseDhcp()) {
        // The address, netmask and gateway are the lease's: the host says whether it has one.
    } else if (config.GetIpv4UseNone()) {
        config.SetIpv4UseNone();
    } else {
        Internal::CheckStaticIpv4(id_.name, id_.netstack, config, [&] {
            std::string owner = area.InterfaceWithAddress(id_.netstack, config.GetIpv4Address());
            return owner == id_.name ? std::string() : owner;
        });
        config.SetDhcpDns(false);
    }
    Internal::CheckIpv6(current, config);
    if (!config.GetUseIpv6Dhcp() && !config.GetUseIpv6RouterAdvertised()) config.SetIpv6DhcpDns(false);
    area.SetIpConfig(id_, config);
}

std::unique_ptr<HostCtl::Network::ConnectionPoint> RealTknNic::GetConnectionPoint() const {
    return Enter("GetConnectionPoint").GetConnectionPoint(id_);
}

std::unique_ptr<HostCtl::Network::Port> RealTknNic::GetPort() const {
    return Enter("GetPort").GetPort(id_);
}

void RealTknNic::AddTag(TknNicTagType tag, bool exclusive) {
    auto& area = Enter("AddTag", Lib::Args(TagArg(tag), exclusive));
    Internal::CheckTagType(tag);
    auto tags = area.GetTags(id_);
    if (std::find(tags.begin(), tags.end(), tag) == tags.end()) {
        tags.push_back(tag);
        area.SetTags(id_, tags);
    }
    if (!exclusive) return;
    for (const auto& other : area.List({})) {
        if (other == id_) continue;
        auto others = area.GetTags(other);
        auto it = std::find(others.begin(), others.end(), tag);
        if (it == others.end()) continue;
        others.erase(it);
        area.SetTags(other, others);
    }
}

void RealTknNic::RemoveTag(TknNicTagType tag) {
    auto& area = Enter("RemoveTag", TagArg(tag));
    Internal::CheckTagType(tag);
    auto tags = area.GetTags(id_);
    auto it = std::find(tags.begin(), tags.end(), tag);
    if (it == tags.end()) {
        throw HostCtlException("Tarkon network interface " + id_.name + " does not carry the tag " +
                               TknNicTagIdToName(tag));
    }
    tags.erase(it);
    area.SetTags(id_, tags);
}

void RealTknNic::GetTags(std::vector<TknNicTagType>& tags) const {
    auto own = Enter("GetTags").GetTags(id_);
    tags.insert(tags.end(), own.begin(), own.end());
}

void RealTknNic::GetMulticastGroups(std::vector<MulticastGroup>& groups) const {
    auto own = Enter("GetMulticastGroups").GetMulticastGroups(id_);
    groups.insert(groups.end(), own.begin(), own.end());
}

void RealTknNic::Remove() {
    Enter("Remove").Remove(id_);
}

void RealTknNic::Refresh() {
    Enter("Refresh").GetLink(id_);
    SetStale(false);
}

namespace Internal {

std::vector<std::unique_ptr<HostCtl::Network::TknNic>> RealTknNics(
    const std::vector<Backend::InterfaceId>& ids) {
    std::vector<std::unique_ptr<HostCtl::Network::TknNic>> out;
    out.reserve(ids.size());
    for (const auto& id : ids)
        out.push_back(std::make_unique<RealTknNic>(id));
    return out;
}

}  // namespace Internal
}  // namespace TknCtl::Network

// Tarkon network interfaces: tags, the information object, creation and removal.
#include <algorithm>
#include <functional>
#include <optional>

#include "backend/host.h"
#include "backend/interfaces.h"
#include "backend/netstacks.h"
#include "core/hook.h"
#include "core/section.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/tknnic.h"
#include "model/netstacks.h"
#include "model/ports.h"
#include "network/tknnic_internal.h"

namespace HostCtl::Network {

TknNic::~TknNic() = default;
TarkonNicInfo::~TarkonNicInfo() = default;

}  // namespace HostCtl::Network

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;
using HostCtl::Network::TknNic;

HostCtl::Network::TknNicTagType TknNicTagNameToId(const std::string& name) {
    return Model::TagId(name);
}

std::string TknNicTagIdToName(HostCtl::Network::TknNicTagType type) {
    const char* name = Model::TagName(type);
    return name ? name : "";
}

std::unique_ptr<HostCtl::Network::TarkonNicInfo> NetworkInfoImpl::GetTarkonNicInfo() {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetTarkonNicInfo");
    return std::make_unique<TarkonNicInfoImpl>();
}

namespace {

// The dedicated netstacks, created when their first interface is.
const char* const kDedicatedNetstacks[] = {"glidex", "faultTolerance", "PellixProvisioning"};

bool IsDedicatedNetstack(const std::string& key) {
    return std::find(std::begin(kDedicatedNetstacks), std::end(kDedicatedNetstacks), key) !=
           std::end(kDedicatedNetstacks);
}

const Model::Netstack& RequireNetstack(const std::string& key) {
    const auto* netstack = Lib::Read<Model::NetstacksSection>().Find(key);
    if (!netstack) throw HostCtlException("Netstack instance " + Lib::Quote(key) + " does not exist");
    return *netstack;
}

std::vector<std::unique_ptr<TknNic>> Collect(const std::function<bool(const Model::TknNic&)>& wanted) {
    std::vector<std::unique_ptr<TknNic>> out;
    for (const auto& nic : Lib::Read<Model::TknNicsSection>().nics) {
        if (wanted(nic)) out.push_back(std::make_unique<TknNicImpl>(nic.name));
    }
    return out;
}

// The lowest "tknN" no interface has.
std::string FreeName() {
    const auto& section = Lib::Read<Model::TknNicsSection>();
    for (int n = 0; n <= 255; ++n) {
        std::string name = "tkn" + std::to_string(n);
        if (!section.Find(name)) return name;
    }
    throw HostCtlException("No free Tarkon network interface name: tkn0 to tkn255 are all in use");
}

// Whether any interface or port uses the MAC address.
bool MacInUse(const HostCtl::Network::MacAddress& mac) {
    const auto& nics = Lib::Read<Model::TknNicsSection>().nics;
    if (std::any_of(nics.begin(), nics.end(), [&](const Model::TknNic& n) { return n.mac == mac; }))
        return true;
    const auto& ports = Lib::Read<Model::PortsSection>().ports;
    return std::any_of(ports.begin(), ports.end(), [&](const Model::Port& p) { return p.mac == mac; });
}

// The rules of a new interface every host keeps, in the order they are checked.
void CheckNewName(const std::string& name) {
    if (!Model::IsTknNicName(name)) {
        throw HostCtlException("Invalid Tarkon network interface name " + Lib::Quote(name) +
                               ": it must be tkn followed by a number from 0 to 255");
    }
}

[[noreturn]] void NameTaken(const std::string& name) {
    throw HostCtlException("A Tarkon network interface named " + name + " already exists");
}

[[noreturn]] void NoSuchNetstack(const std::string& key) {
    throw HostCtlException("Netstack instance " + Lib::Quote(key) + " does not exist");
}

void CheckUnicast(const HostCtl::Network::MacAddress& mac) {
    if (!mac.IsUnicast()) {
        throw HostCtlException("MAC address " + mac.GetStringAddress() +
                               " is a group address; an interface needs a unicast address");
    }
}

[[noreturn]] void MacTaken(const HostCtl::Network::MacAddress& mac) {
    throw HostCtlException("MAC address " + mac.GetStringAddress() + " is already in use");
}

// An MTU, a number of RX dispatch queues and a TSO MSS asked for (0: the host's default).
void CheckSizes(unsigned mtu, unsigned rxQueues, unsigned tsoMss) {
    if (mtu != 0 &&
        (mtu < static_cast<unsigned>(TknNic::MIN_MTU) || mtu > static_cast<unsigned>(TknNic::MAX_MTU))) {
        throw HostCtlException("Invalid MTU " + std::to_string(mtu) + ": it must be between " +
                               std::to_string(TknNic::MIN_MTU) + " and " + std::to_string(TknNic::MAX_MTU));
    }
    if (rxQueues > TknNic::MAX_RX_DISP_QUEUES) {
        throw HostCtlException("Invalid number of RX dispatch queues " + std::to_string(rxQueues) +
                               ": it must be between 1 and " + std::to_string(TknNic::MAX_RX_DISP_QUEUES));
    }
    if (tsoMss > TknNic::DEFAULT_TSO_MSS) {
        throw HostCtlException("Invalid TSO MSS " + std::to_string(tsoMss) + ": it must be at most " +
                               std::to_string(TknNic::DEFAULT_TSO_MSS));
    }
}

// A connection point of a real host, as messages name it.
std::string DescribeRealConnection(const HostCtl::Network::ConnectionPoint& point) {
    if (point.GetConnectionType() == HostCtl::Network::ConnectionPoint::TYPE_PORTGROUP)
        return "port group " + Lib::Quote(point.GetPortGroupName());
    return "connection point";
}

// AddTarkonNic on a real host: the rules of the simulated host, in its order, the host
// answering for what it holds; then the netstack (a dedicated one is made, one kept disabled
// is enabled), the interface and its IP configuration. A step that fails takes back what the
// steps before it did.
std::unique_ptr<TknNic> AddRealTknNic(Backend::Host& host, const HostCtl::Network::ConnectionPoint& point,
                                      const std::string& netstack, const HostCtl::Network::IpConfig& config,
                                      const HostCtl::Network::MacAddress& mac, unsigned tsoMss, unsigned mtu,
                                      unsigned rxQueues, const std::string& name) {
    auto& area = host.GetInterfaces();
    if (auto attached = area.AttachedAt(point)) {
        throw HostCtlException("The " + DescribeRealConnection(point) +
                               " already has a Tarkon network interface (" + attached->name + ")");
    }
    area.CheckAttachable(point);
    if (!name.empty()) {
        CheckNewName(name);
        if (area.Find(name)) NameTaken(name);
    }
    auto& netstacks = host.GetNetstacks();
    const auto entry = netstacks.Find(netstack);
    if (!entry && !IsDedicatedNetstack(netstack)) NoSuchNetstack(netstack);
    if (!mac.IsZero()) {
        CheckUnicast(mac);
        if (area.MacInUse(mac)) MacTaken(mac);
    }
    CheckSizes(mtu, rxQueues, tsoMss);

    bool made = false;
    bool enabled = false;
    if (!entry) {
        // What the simulated host gives a netstack it makes.
        const Model::Netstack defaults;
        Backend::NetstackSettings settings;
        settings.maxConnections = defaults.maxConnections;
        settings.congestionControl = defaults.congestionControl;
        settings.ipv6Enabled = defaults.ipv6Enabled;
        netstacks.Add(netstack, netstack, settings, false);
        made = true;
    } else if (!entry->enabled) {
        netstacks.Enable(netstack);
        enabled = true;
    }
    // Takes back what was done for the interface; a failure of that is told with the failure
    // that led to it.
    auto undo = [&](const std::string& failure, const std::optional<Backend::InterfaceId>& id) {
        std::string left;
        if (id) {
            try {
                area.Remove(*id);
            } catch (const HostCtlException& e) {
                left += "; " + id->name + " could not be removed again: " + e.GetMessage();
            }
        }
        try {
            if (made) netstacks.Remove(netstack, false);
            if (enabled) netstacks.Disable(netstack);
        } catch (const HostCtlException& e) {
            left += "; netstack instance " + Lib::Quote(netstack) + (made ? " made" : " enabled") +
                    " for it could not be " + (made ? "removed" : "disabled") + " again: " + e.GetMessage();
        }
        if (!left.empty()) throw HostCtlException(failure + left);
    };
    std::optional<Backend::InterfaceId> id;
    try {
        id = area.Add(point, netstack, mac, tsoMss != 0 ? tsoMss : TknNic::DEFAULT_TSO_MSS,
                      mtu != 0 ? mtu : TknNic::DEFAULT_MTU,
                      rxQueues != 0 ? rxQueues : TknNic::DEFAULT_RX_DISP_QUEUES, name);
        auto nic = std::make_unique<RealTknNic>(*id);
        nic->SetIpConfig(config);
        return nic;
    } catch (const HostCtlException& failure) {
        undo(failure.GetMessage(), id);
        throw;
    } catch (...) {
        try {
            undo({}, id);
        } catch (const HostCtlException&) {
            // the first failure is the one told
        }
        throw;
    }
}

// A unique locally administered address: 02:48:44:00:xx:yy, the lowest free from :00:10 on.
HostCtl::Network::MacAddress FreeMac() {
    for (std::uint32_t n = 0x10; n <= 0xffff; ++n) {
        HostCtl::Network::MacAddress mac(HostCtl::Network::MacAddress::Bytes{
            0x02, 0x48, 0x44, 0x00, static_cast<std::uint8_t>(n >> 8), static_cast<std::uint8_t>(n & 0xff)});
        if (!MacInUse(mac)) return mac;
    }
    throw HostCtlException("No free MAC address for a Tarkon network interface");
}

}  // namespace

TarkonNicInfoImpl::TarkonNicInfoImpl() = default;
TarkonNicInfoImpl::~TarkonNicInfoImpl() = default;

std::vector<std::unique_ptr<TknNic>> TarkonNicInfoImpl::GetTarkonNics() {
    Lib::Enter("TknCtl::Network::TarkonNicInfoImpl::GetTarkonNics");
    if (auto* host = Lib::RealHost()) return Internal::RealTknNics(host->GetInterfaces().List({}));
    return Collect([](const Model::TknNic&) { return true; });
}

std::vector<std::unique_ptr<TknNic>> TarkonNicInfoImpl::GetTarkonNicsByInstanceKey(
    const std::string& netstack) {
    Lib::Enter("TknCtl::Network::TarkonNicInfoImpl::GetTarkonNicsByInstanceKey", netstack);
    if (auto* host = Lib::RealHost()) return Internal::RealTknNics(host->GetInterfaces().List(netstack));
    RequireNetstack(netstack);
    return Collect([&](const Model::TknNic& nic) { return nic.netstack == netstack; });
}

std::unique_ptr<TknNic> TarkonNicInfoImpl::GetTarkonNicByInterface(const std::string& name, bool mustExist) {
    Lib::Enter("TknCtl::Network::TarkonNicInfoImpl::GetTarkonNicByInterface", name, Lib::Args(mustExist));
    if (auto* host = Lib::RealHost()) {
        auto id = host->GetInterfaces().Find(name);
        if (id) return std::make_unique<RealTknNic>(std::move(*id));
        if (mustExist)
            throw HostCtlException("Tarkon network interface " + Lib::Quote(name) + " does not exist");
        return nullptr;
    }
    if (!Lib::Read<Model::TknNicsSection>().Find(name)) {
        if (mustExist) Internal::FindTknNic(name);  // throws
        return nullptr;
    }
    return std::make_unique<TknNicImpl>(name);
}

std::vector<std::unique_ptr<TknNic>> TarkonNicInfoImpl::GetTarkonNicsByTag(
    HostCtl::Network::TknNicTagType tag) {
    Lib::Enter("TknCtl::Network::TarkonNicInfoImpl::GetTarkonNicsByTag", {}, Lib::Args(tag));
    if (auto* host = Lib::RealHost()) {
        auto& area = host->GetInterfaces();
        std::vector<Backend::InterfaceId> carrying;
        for (auto& id : area.List({})) {
            auto tags = area.GetTags(id);
            if (std::find(tags.begin(), tags.end(), tag) != tags.end()) carrying.push_back(std::move(id));
        }
        return Internal::RealTknNics(carrying);
    }
    return Collect([&](const Model::TknNic& nic) {
        return std::find(nic.tags.begin(), nic.tags.end(), tag) != nic.tags.end();
    });
}

void TarkonNicInfoImpl::GetTarkonNicNamesByInstanceKey(std::vector<std::string>& names,
                                                       const std::string& netstack) {
    Lib::Enter("TknCtl::Network::TarkonNicInfoImpl::GetTarkonNicNamesByInstanceKey", netstack);
    if (auto* host = Lib::RealHost()) {
        for (auto& id : host->GetInterfaces().List(netstack))
            names.push_back(std::move(id.name));
        return;
    }
    RequireNetstack(netstack);
    for (const auto& nic : Lib::Read<Model::TknNicsSection>().nics) {
        if (nic.netstack == netstack) names.push_back(nic.name);
    }
}

std::unique_ptr<TknNic> TarkonNicInfoImpl::AddTarkonNic(HostCtl::Network::ConnectionPoint* connectionPoint,
                                                        const std::string& netstack,
                                                        const HostCtl::Network::IpConfig& config,
                                                        const HostCtl::Network::MacAddress& mac,
                                                        unsigned tsoMss, unsigned mtu, unsigned rxQueues,
                                                        const std::string& name) {
    Lib::Enter("TknCtl::Network::TarkonNicInfoImpl::AddTarkonNic", netstack,
               Lib::Args(name, mac.IsZero() ? std::string() : mac.GetStringAddress(), tsoMss, mtu, rxQueues));
    if (!connectionPoint) throw HostCtlException("A Tarkon network interface needs a connection point");
    if (auto* host = Lib::RealHost())
        return AddRealTknNic(*host, *connectionPoint, netstack, config, mac, tsoMss, mtu, rxQueues, name);

    // Everything is checked before anything changes.
    Model::TknNic nic;
    nic.connection = Internal::ToModelConnection(*connectionPoint);
    Internal::CheckAttachable(nic.connection);

    if (name.empty()) {
        nic.name = FreeName();
    } else {
        CheckNewName(name);
        if (Lib::Read<Model::TknNicsSection>().Find(name)) NameTaken(name);
        nic.name = name;
    }

    const auto* stack = Lib::Read<Model::NetstacksSection>().Find(netstack);
    if (!stack && !IsDedicatedNetstack(netstack)) NoSuchNetstack(netstack);
    nic.netstack = netstack;

    if (mac.IsZero()) {
        nic.mac = FreeMac();
    } else {
        CheckUnicast(mac);
        if (MacInUse(mac)) MacTaken(mac);
        nic.mac = mac;
    }

    CheckSizes(mtu, rxQueues, tsoMss);
    nic.mtu = mtu != 0 ? mtu : TknNic::DEFAULT_MTU;
    nic.rxDispQueues = rxQueues != 0 ? rxQueues : TknNic::DEFAULT_RX_DISP_QUEUES;
    nic.tsoMss = tsoMss != 0 ? tsoMss : TknNic::DEFAULT_TSO_MSS;
    nic.enabled = true;
    nic.ipConfig = Internal::CheckedIpConfig(nic, nullptr, config);

    // The netstack: a dedicated one is created, one that is only configured is enabled.
    if (!stack) {
        Model::Netstack created;
        created.key = netstack;
        created.name = netstack;
        Lib::Write<Model::NetstacksSection>().netstacks.push_back(created);
    } else if (stack->state != Model::kNetstackEnabled) {
        auto* enabled = Lib::Write<Model::NetstacksSection>().Find(netstack);
        enabled->state = Model::kNetstackEnabled;
        enabled->currentMaxConnections = enabled->maxConnections;
        enabled->currentIpv6Enabled = enabled->ipv6Enabled;
    }

    std::string created = nic.name;
    Lib::Write<Model::TknNicsSection>().nics.push_back(std::move(nic));
    auto& stored = Internal::FindTknNicForWrite(created);
    stored.portId = Internal::Attach(stored);
    Internal::SyncTknNic(created);
    return std::make_unique<TknNicImpl>(created);
}

void TarkonNicInfoImpl::RemoveTarkonNic(HostCtl::Network::ConnectionPoint* connectionPoint,
                                        const std::string& netstack) {
    Lib::Enter("TknCtl::Network::TarkonNicInfoImpl::RemoveTarkonNic", netstack);
    if (!connectionPoint) throw HostCtlException("No connection point given");
    if (auto* host = Lib::RealHost()) {
        auto& area = host->GetInterfaces();
        auto id = area.AttachedAt(*connectionPoint);
        if (!id) {
            throw HostCtlException("No Tarkon network interface is attached to " +
                                   DescribeRealConnection(*connectionPoint));
        }
        if (id->netstack != netstack) {
            throw HostCtlException("The Tarkon network interface at " +
                                   DescribeRealConnection(*connectionPoint) + " (" + id->name +
                                   ") belongs to netstack " + Lib::Quote(id->netstack) + ", not " +
                                   Lib::Quote(netstack));
        }
        return area.Remove(*id);
    }
    Model::ConnectionPoint point = Internal::ToModelConnection(*connectionPoint);
    for (const auto& nic : Lib::Read<Model::TknNicsSection>().nics) {
        if (!Internal::SameConnection(nic.connection, point)) continue;
        if (nic.netstack != netstack) {
            throw HostCtlException("The Tarkon network interface at " + Internal::DescribeConnection(point) +
                                   " (" + nic.name + ") belongs to netstack " + Lib::Quote(nic.netstack) +
                                   ", not " + Lib::Quote(netstack));
        }
        Internal::RemoveTknNic(nic.name);  // nic is gone after this
        return;
    }
    throw HostCtlException("No Tarkon network interface is attached to " +
                           Internal::DescribeConnection(point));
}

}  // namespace TknCtl::Network

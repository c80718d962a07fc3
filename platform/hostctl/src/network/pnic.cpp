// Physical NICs: lookups, identity, link and the general settings.
#include <algorithm>
#include <limits>

#include "backend/nics.h"
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

using HostCtl::Lib::HostCtlException;
namespace Net = HostCtl::Network;

namespace {

const Model::Pnic& Enter(const char* operation, const std::string& name, const std::string& arguments = {}) {
    Lib::Enter(std::string("HostCtl::Network::Pnic::") + operation, name, arguments);
    return Model::ReadPnic(name);
}

// The real host's NICs, when the session manages one.
Backend::Nics* Real(const char* operation, const std::string& name) {
    return Backend::EnterRealNics(std::string("HostCtl::Network::Pnic::") + operation, name);
}

Net::MacAddress MacOf(const std::string& text) {
    return Net::MacAddress::IsWellFormed(text) ? Net::MacAddress(text) : Net::MacAddress();
}

const char* PortText(std::uint32_t port) {
    static const char* const kNames[] = {"TP", "AUI", "BNC", "MII", "FIBRE", "DA"};
    return port < std::size(kNames) ? kNames[port] : "UNKNOWN";
}

const char* WakeOnText(std::uint32_t mode) {
    static const char* const kNames[] = {"PHY activity", "unicast",     "multicast", "broadcast",
                                         "ARP",          "MagicPacket", "SecureOn"};
    return mode < std::size(kNames) ? kNames[mode] : "unknown";
}

std::string DuplexText(std::uint32_t duplex) {
    return duplex == Net::PNIC_DUPLEX_FULL ? "full" : duplex == Net::PNIC_DUPLEX_HALF ? "half" : "auto";
}

}  // namespace

// ---------------------------------------------------------------- lookups

PnicImpl::PnicImpl(std::string name) : name_(std::move(name)) {}
PnicImpl::~PnicImpl() = default;

bool PnicImpl::IsValidPnic(const std::string& name) {
    if (auto* nics = Backend::EnterRealNics("TknCtl::Network::PnicImpl::IsValidPnic", name))
        return nics->Has(name);
    Lib::Enter("TknCtl::Network::PnicImpl::IsValidPnic", name);
    return Lib::Read<Model::PnicsSection>().Find(name) != nullptr;
}

std::unique_ptr<HostCtl::Network::Port> PnicImpl::GetPort() const {
    Lib::Enter("TknCtl::Network::PnicImpl::GetPort", name_);
    for (const auto& port : Lib::Read<Model::PortsSection>().ports) {
        if (port.type == Model::kPortUplink && port.client == name_)
            return std::make_unique<PortImpl>(port.id);
    }
    return nullptr;
}

std::vector<std::unique_ptr<HostCtl::Network::Pnic>> NetworkInfoImpl::GetPnics() {
    std::vector<std::unique_ptr<HostCtl::Network::Pnic>> nics;
    if (auto* real = Backend::EnterRealNics("TknCtl::Network::NetworkInfoImpl::GetPnics")) {
        for (auto& name : real->List())
            nics.push_back(std::make_unique<PnicImpl>(std::move(name)));
        return nics;
    }
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetPnics");
    for (const auto& nic : Lib::Read<Model::PnicsSection>().nics)
        nics.push_back(std::make_unique<PnicImpl>(nic.name));
    return nics;
}

std::unique_ptr<HostCtl::Network::Pnic> NetworkInfoImpl::GetPnicByName(const std::string& name) {
    if (auto* nics = Backend::EnterRealNics("TknCtl::Network::NetworkInfoImpl::GetPnicByName", name))
        return nics->Has(name) ? std::make_unique<PnicImpl>(name) : nullptr;
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetPnicByName", name);
    if (!Lib::Read<Model::PnicsSection>().Find(name)) return nullptr;
    return std::make_unique<PnicImpl>(name);
}

// ---------------------------------------------------------------- identity and link

std::string PnicImpl::GetName() const {
    Lib::Enter("HostCtl::Network::Pnic::GetName", name_);
    return name_;
}

std::unique_ptr<Net::PciDevice> PnicImpl::GetPciDevice() const {
    if (auto* nics = Real("GetPciDevice", name_)) return nics->GetPciDevice(name_);
    const auto& nic = Enter("GetPciDevice", name_);
    if (!nic.pci) return nullptr;
    return std::make_unique<Net::PciDevice>(nic.pci->address, nic.pci->vendor, nic.pci->device);
}

std::string PnicImpl::GetDeviceDescription() const {
    if (auto* nics = Real("GetDeviceDescription", name_)) return nics->GetDeviceDescription(name_);
    return Enter("GetDeviceDescription", name_).description;
}

std::string PnicImpl::GetDriverName() const {
    if (auto* nics = Real("GetDriverName", name_)) {
        Net::PnicDriverInfo info;
        nics->GetDriverInfo(name_, info);
        return info.driver;
    }
    return Enter("GetDriverName", name_).driver.name;
}

bool PnicImpl::IsLinkUp() const {
    if (auto* nics = Real("IsLinkUp", name_)) return nics->GetLink(name_).linkUp;
    return Enter("IsLinkUp", name_).linkUp;
}

bool PnicImpl::IsLinkStatusUp() const {
    if (auto* nics = Real("IsLinkStatusUp", name_)) return nics->GetLink(name_).linkStatusUp;
    const auto& nic = Enter("IsLinkStatusUp", name_);
    return nic.adminUp && nic.linkUp;
}

bool PnicImpl::IsAdminUp() const {
    if (auto* nics = Real("IsAdminUp", name_)) return nics->GetLink(name_).adminUp;
    return Enter("IsAdminUp", name_).adminUp;
}

std::uint32_t PnicImpl::GetLinkSpeed() const {
    if (auto* nics = Real("GetLinkSpeed", name_)) return nics->GetLink(name_).speed;
    const auto& nic = Enter("GetLinkSpeed", name_);
    return nic.linkUp ? nic.speed : 0;
}

std::uint32_t PnicImpl::GetDuplex() const {
    if (auto* nics = Real("GetDuplex", name_)) return nics->GetLink(name_).duplex;
    const auto& nic = Enter("GetDuplex", name_);
    return nic.linkUp ? nic.duplex : Net::PNIC_DUPLEX_HALF;
}

Net::MacAddress PnicImpl::GetMacAddress() const {
    if (auto* nics = Real("GetMacAddress", name_)) return MacOf(nics->GetLink(name_).mac);
    return Enter("GetMacAddress", name_).mac;
}

std::uint32_t PnicImpl::GetMtu() const {
    if (auto* nics = Real("GetMtu", name_)) return nics->GetLink(name_).mtu;
    return Enter("GetMtu", name_).mtu;
}

void PnicImpl::GetDriverInfo(Net::PnicDriverInfo& info) const {
    if (auto* nics = Real("GetDriverInfo", name_)) return nics->GetDriverInfo(name_, info);
    const auto& driver = Enter("GetDriverInfo", name_).driver;
    info.driver = driver.name;
    info.version = driver.version;
    info.firmwareVersion = driver.firmwareVersion;
    info.busInfo = driver.busInfo;
}

void PnicImpl::SetAdminUp(bool up) {
    if (auto* nics = Real("SetAdminUp", name_)) return nics->SetAdminUp(name_, up);
    Enter("SetAdminUp", name_, Lib::Args(up));
    auto& nic = Model::WritePnic(name_);
    nic.adminUp = up;
    nic.linkUp = up && nic.carrier;
    Model::ResolvePause(nic);
}

void PnicImpl::SetSpeedDuplex(std::uint32_t speed, std::uint32_t duplex) {
    if (auto* nics = Real("SetSpeedDuplex", name_)) return nics->SetSpeedDuplex(name_, speed, duplex);
    const auto& current = Enter("SetSpeedDuplex", name_, Lib::Args(speed, duplex));
    if (speed == 0 && duplex == Net::PNIC_DUPLEX_AUTO) {
        if (!current.settings.supportsAutoNegotiation)
            throw HostCtlException(name_ + " does not support auto-negotiation");
        auto& nic = Model::WritePnic(name_);
        nic.settings.autoNegotiation = true;
        Model::Renegotiate(nic);
        return;
    }
    if (speed == 0 || (duplex != Net::PNIC_DUPLEX_FULL && duplex != Net::PNIC_DUPLEX_HALF)) {
        throw HostCtlException("Invalid speed and duplex " + std::to_string(speed) + "/" +
                               std::to_string(duplex) +
                               ": give a speed in Mbps with full (1) or half (2) duplex, or 0/0 for "
                               "auto-negotiation");
    }
    const auto& modes = current.settings.supportedModes;
    if (std::none_of(modes.begin(), modes.end(),
                     [&](const Model::LinkMode& m) { return m.speed == speed && m.duplex == duplex; })) {
        std::string supported;
        for (const auto& m : modes)
            supported +=
                (supported.empty() ? "" : ", ") + std::to_string(m.speed) + "/" + DuplexText(m.duplex);
        throw HostCtlException(name_ + " does not support " + std::to_string(speed) + " Mbps " +
                               DuplexText(duplex) +
                               " duplex (supported: " + (supported.empty() ? "none" : supported) + ")");
    }
    auto& nic = Model::WritePnic(name_);
    nic.settings.autoNegotiation = false;
    nic.speed = speed;
    nic.duplex = duplex;
    Model::ResolvePause(nic);
}

// ---------------------------------------------------------------- general settings

void PnicImpl::GetPnicInfo(Net::PnicInfo& info) const {
    if (auto* nics = Real("GetPnicInfo", name_)) return nics->GetPnicInfo(name_, info);
    const auto& nic = Enter("GetPnicInfo", name_);
    const auto& s = nic.settings;
    info = Net::PnicInfo();
    info.supportedPorts = s.supportedPorts;
    info.supportsAutoNegotiation = s.supportsAutoNegotiation;
    for (const auto& mode : s.advertisedModes)
        info.advertisedLinkModes.push_back({mode.speed, mode.duplex, mode.media});
    info.advertisedAutoNegotiation = s.advertisedAutoNegotiation;
    info.port = s.port;
    info.phyAddress = s.phyAddress;
    info.transceiver = s.transceiver;
    info.autoNegotiation = s.autoNegotiation;
    info.supportsWakeOn = s.supportsWakeOn;
    for (auto mode : s.wakeOn)
        info.wakeOn.push_back(static_cast<Net::WakeOnMode>(mode));
    info.messageLevelSupported = s.supportsMessageLevel;
    info.messageLevel = s.messageLevel;
    info.virtualAddress = s.virtualAddress;
    info.linkStatus = nic.linkUp ? "Up" : "Down";
}

namespace {

// The attributes a settings record changes, as journal text.
std::string ChangedAttributes(const Net::PnicInfo& info) {
    std::string out;
    auto add = [&out](const std::string& text) { out += (out.empty() ? "" : " ") + text; };
    if (info.portChanged) add("port=" + std::to_string(info.port));
    if (info.phyAddressChanged) add("phyAddress=" + std::to_string(info.phyAddress));
    if (info.virtualAddressChanged) add("virtualAddress=" + info.virtualAddress);
    if (info.transceiverChanged) add("transceiver=" + std::to_string(info.transceiver));
    if (info.wakeOnChanged) {
        std::string modes;
        for (auto mode : info.wakeOn)
            modes += (modes.empty() ? "" : ",") + std::to_string(mode);
        add("wakeOn=" + modes);
    }
    if (info.messageLevelChanged) add("messageLevel=" + std::to_string(info.messageLevel));
    return out;
}

}  // namespace

void PnicImpl::SetPnicInfo(const Net::PnicInfo& info) {
    if (auto* nics = Real("SetPnicInfo", name_)) return nics->SetPnicInfo(name_, info);
    const auto& current = Enter("SetPnicInfo", name_, ChangedAttributes(info));
    const auto& s = current.settings;
    // Check the whole request before anything changes.
    if (info.portChanged &&
        std::find(s.supportedPorts.begin(), s.supportedPorts.end(), info.port) == s.supportedPorts.end()) {
        std::string supported;
        for (auto port : s.supportedPorts)
            supported += (supported.empty() ? "" : ", ") + std::string(PortText(port));
        throw HostCtlException("Port " + std::string(PortText(info.port)) + " is not supported by " + name_ +
                               " (supported: " + (supported.empty() ? "none" : supported) + ")");
    }
    if (info.phyAddressChanged && (info.phyAddress < 0 || info.phyAddress > 31))
        throw HostCtlException("PHY address " + std::to_string(info.phyAddress) +
                               " is out of range (0 to 31)");
    if (info.virtualAddressChanged && !info.virtualAddress.empty() &&
        !Net::MacAddress::IsValid(info.virtualAddress)) {
        throw HostCtlException("Invalid virtual address '" + info.virtualAddress +
                               "': expected a unicast MAC address such as 02:00:00:00:00:01");
    }
    if (info.transceiverChanged && info.transceiver != Net::PNIC_TRANSCEIVER_INTERNAL &&
        info.transceiver != Net::PNIC_TRANSCEIVER_EXTERNAL)
        throw HostCtlException("Invalid transceiver code " + std::to_string(info.transceiver));
    if (info.wakeOnChanged) {
        if (!s.supportsWakeOn) throw HostCtlException(name_ + " does not support Wake-on-LAN");
        for (auto mode : info.wakeOn) {
            if (std::find(s.supportedWakeOn.begin(), s.supportedWakeOn.end(), mode) ==
                s.supportedWakeOn.end())
                throw HostCtlException(name_ + " does not support Wake-on " + WakeOnText(mode));
        }
    }
    if (info.messageLevelChanged) {
        if (!s.supportsMessageLevel)
            throw HostCtlException(name_ + " does not support a driver message level");
        if (info.messageLevel < 0 || info.messageLevel > std::numeric_limits<std::uint32_t>::max()) {
            throw HostCtlException("Message level " + std::to_string(info.messageLevel) +
                                   " is out of range (0 to 4294967295)");
        }
    }

    auto& settings = Model::WritePnic(name_).settings;
    if (info.portChanged) settings.port = info.port;
    if (info.phyAddressChanged) settings.phyAddress = static_cast<std::uint32_t>(info.phyAddress);
    if (info.virtualAddressChanged) settings.virtualAddress = info.virtualAddress;
    if (info.transceiverChanged) settings.transceiver = info.transceiver;
    if (info.wakeOnChanged) {
        // The driver keeps a set of modes: a mode given twice is enabled once.
        settings.wakeOn.clear();
        for (auto mode : info.wakeOn) {
            if (std::find(settings.wakeOn.begin(), settings.wakeOn.end(), mode) == settings.wakeOn.end())
                settings.wakeOn.push_back(mode);
        }
    }
    if (info.messageLevelChanged) settings.messageLevel = static_cast<std::uint32_t>(info.messageLevel);
}

}  // namespace TknCtl::Network

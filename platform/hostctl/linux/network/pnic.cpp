// The physical NICs of the Linux host: which interfaces they are, their identity, link and
// general settings (port, PHY address, Wake-on-LAN, driver message level, MAC address, speed
// and duplex).
#include "network/pnic.h"

#include <linux/ethtool.h>
#include <linux/ethtool_netlink.h>
#include <net/if.h>

#include <algorithm>
#include <cctype>
#include <cerrno>

#include "hostctl/exception.h"
#include "kernel/sysfs.h"
#include "network/areas.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;
namespace Net = HostCtl::Network;

void Refuse(const std::string& what, const Kernel::EthtoolRefusal& refusal) {
    throw HostCtlException(what + ": " + refusal.what());
}

// ---------------------------------------------------------------- link modes

namespace {

// The media codes of the library's link modes (PnicLinkMode::media), by the medium part of
// the kernel's mode names (1000base"T", 10000base"KR", ...). Media the table lacks are 1,
// "Unknown".
std::uint32_t MediaCode(const std::string& medium) {
    static const std::pair<const char*, std::uint32_t> kMedia[] = {
        {"T", 2},    {"T1", 2},   {"T1L", 2},  {"X", 3},    {"KX", 4},   {"SX", 5},  {"LX", 6},
        {"KR", 7},   {"LR", 8},   {"SR", 9},   {"ER", 10},  {"LRM", 13}, {"CR", 14}, {"KR2", 15},
        {"KR4", 17}, {"KX4", 18}, {"CR4", 19}, {"SR4", 20}, {"LR4", 21}};
    // "LR4_ER4", "LR_ER_FR": the first medium a mode covers.
    const std::string first = medium.substr(0, medium.find('_'));
    for (const auto& [name, code] : kMedia) {
        if (first == name) return code;
    }
    return 1;
}

std::string Join(const std::vector<std::string>& parts) {
    std::string out;
    for (const auto& part : parts)
        out += (out.empty() ? "" : ", ") + part;
    return out;
}

std::string Lower(std::string text) {
    for (auto& c : text)
        c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    return text;
}

// The kernel's port names of supported link modes as the library's port codes.
std::optional<std::uint32_t> PortCode(const std::string& name) {
    static const std::pair<const char*, std::uint32_t> kPorts[] = {
        {"TP", Net::PNIC_PORT_TP},   {"AUI", Net::PNIC_PORT_AUI},     {"BNC", Net::PNIC_PORT_BNC},
        {"MII", Net::PNIC_PORT_MII}, {"FIBRE", Net::PNIC_PORT_FIBRE},
    };
    for (const auto& [port, code] : kPorts) {
        if (name == port) return code;
    }
    return std::nullopt;
}

const char* WakeOnName(std::uint32_t mode) {
    static const char* const kNames[] = {"PHY activity", "unicast",     "multicast", "broadcast",
                                         "ARP",          "MagicPacket", "SecureOn"};
    return mode < std::size(kNames) ? kNames[mode] : "unknown";
}

// The speed the kernel reports (SPEED_UNKNOWN when there is no link) in Mbps, 0 for unknown.
std::uint32_t SpeedOf(const Kernel::EthtoolReply& modes) {
    const auto speed = modes.Value(ETHTOOL_A_LINKMODES_SPEED, 0);
    return speed == static_cast<std::uint32_t>(SPEED_UNKNOWN) || speed > 0xffffffffULL
               ? 0
               : static_cast<std::uint32_t>(speed);
}

}  // namespace

std::optional<Net::PnicLinkMode> ParseLinkModeName(const std::string& name) {
    // SPEED "base" MEDIUM "/" DUPLEX
    std::size_t digits = 0;
    while (digits < name.size() && std::isdigit(static_cast<unsigned char>(name[digits])))
        ++digits;
    if (digits == 0 || digits > 9 || name.compare(digits, 4, "base") != 0) return std::nullopt;
    const auto slash = name.find('/', digits + 4);
    if (slash == std::string::npos) return std::nullopt;
    const std::string duplex = name.substr(slash + 1);
    Net::PnicLinkMode mode;
    mode.speed = static_cast<std::uint32_t>(std::stoul(name.substr(0, digits)));
    if (duplex == "Full") {
        mode.duplex = Net::PNIC_DUPLEX_FULL;
    } else if (duplex == "Half") {
        mode.duplex = Net::PNIC_DUPLEX_HALF;
    } else {
        return std::nullopt;
    }
    mode.media = MediaCode(name.substr(digits + 4, slash - digits - 4));
    return mode;
}

// ---------------------------------------------------------------- the area

LinuxNics::LinuxNics(Context& context, std::string sysfs) : context_(context), sysfs_(std::move(sysfs)) {}

bool IsPhysicalNic(const Config& config, const std::string& sysfs, const std::string& name) {
    return Kernel::HasNetDevice(sysfs, name) || config.NamesNic(name);
}

bool LinuxNics::IsNic(const Kernel::Link& link) const {
    return !link.loopback && IsPhysicalNic(context_.GetConfig(), sysfs_, link.name);
}

Kernel::Link LinuxNics::Require(const std::string& name) {
    std::optional<Kernel::Link> link;
    if (!name.empty() && name.size() < IFNAMSIZ && name.find('/') == std::string::npos)
        link = Kernel::FindLink(Own(), name);
    if (!link) throw HostCtlException("Physical NIC " + name + " does not exist");
    if (!IsNic(*link)) {
        throw HostCtlException(name +
                               " is not a physical NIC: no device backs it in sysfs and the nics line of "
                               "the configuration does not name it");
    }
    return *link;
}

Kernel::Ethtool& LinuxNics::Ethtool() {
    if (!ethtool_) ethtool_ = std::make_unique<Kernel::Ethtool>(Own());
    return *ethtool_;
}

Kernel::EthtoolReply LinuxNics::Get(std::uint8_t command, const std::string& name, const std::string& what) {
    try {
        return Ethtool().Get(command, name);
    } catch (const Kernel::EthtoolRefusal& refusal) {
        Refuse("Cannot read " + what + " of " + name, refusal);
    }
}

std::optional<Kernel::EthtoolReply> LinuxNics::GetIfSupported(std::uint8_t command, const std::string& name,
                                                              const std::string& what) {
    try {
        return Ethtool().Get(command, name);
    } catch (const Kernel::EthtoolRefusal& refusal) {
        if (refusal.Unsupported()) return std::nullopt;
        Refuse("Cannot read " + what + " of " + name, refusal);
    }
}

void LinuxNics::Change(nl_msg* request, const std::string& name, const std::string& what) {
    try {
        Ethtool().Set(request);
    } catch (const Kernel::EthtoolRefusal& refusal) {
        Refuse("Cannot change " + what + " of " + name, refusal);
    }
}

std::string LinuxNics::DriverOf(const std::string& name) {
    try {
        return Kernel::ReadDriverInfo(name).driver;
    } catch (const Kernel::EthtoolRefusal&) {
        return "unknown";
    }
}

std::vector<std::string> LinuxNics::List() {
    std::vector<std::string> names;
    for (auto& link : Kernel::ListLinks(Own())) {
        if (IsNic(link)) names.push_back(std::move(link.name));
    }
    return names;
}

bool LinuxNics::Has(const std::string& name) {
    if (name.empty() || name.size() >= IFNAMSIZ || name.find('/') != std::string::npos) return false;
    const auto link = Kernel::FindLink(Own(), name);
    return link && IsNic(*link);
}

// ---------------------------------------------------------------- identity

std::unique_ptr<Net::PciDevice> PciDeviceOf(const Kernel::NetDevice& device,
                                            const std::pair<std::string, std::string>& names) {
    if (device.bus != Kernel::NetDevice::Bus::kPci || device.pciAddress.empty()) return nullptr;
    return std::make_unique<Net::PciDevice>(
        device.pciAddress, names.first.empty() ? "Vendor " + device.vendorId : names.first,
        names.second.empty() ? "Device " + device.deviceId : names.second);
}

std::string DeviceDescription(const std::optional<Kernel::NetDevice>& device, const std::string& kind) {
    if (!device) return "virtual device" + (kind.empty() ? std::string() : " (" + kind + ")");
    if (device->bus == Kernel::NetDevice::Bus::kUsb) {
        // The adapter's own strings, else its IDs; a colon in them would split the
        // description, so it becomes a blank.
        auto part = [](std::string text, const std::string& id) {
            if (text.empty()) text = id;
            std::replace(text.begin(), text.end(), ':', ' ');
            return text;
        };
        return "USB-NIC:" + part(device->vendorName, device->vendorId) + ":" +
               part(device->deviceName, device->deviceId);
    }
    if (device->bus == Kernel::NetDevice::Bus::kPci) return "PCI device " + device->pciAddress;
    return device->subsystem + " device " + device->name;
}

std::unique_ptr<Net::PciDevice> LinuxNics::GetPciDevice(const std::string& name) {
    Require(name);
    const auto device = Kernel::ReadNetDevice(sysfs_, name);
    if (!device || device->bus != Kernel::NetDevice::Bus::kPci) return nullptr;
    return PciDeviceOf(*device, Kernel::LookupPciNames(device->vendorId, device->deviceId));
}

std::string LinuxNics::GetDeviceDescription(const std::string& name) {
    const auto link = Require(name);
    return DeviceDescription(Kernel::ReadNetDevice(sysfs_, name), link.kind);
}

// A device whose driver gives no information (the kernel finds neither the driver's own nor
// that of a parent device) shows empty texts.
void LinuxNics::GetDriverInfo(const std::string& name, Net::PnicDriverInfo& info) {
    Require(name);
    info = Net::PnicDriverInfo();
    try {
        const auto driver = Kernel::ReadDriverInfo(name);
        info.driver = driver.driver;
        info.version = driver.version;
        info.firmwareVersion = driver.firmwareVersion;
        info.busInfo = driver.busInfo;
    } catch (const Kernel::EthtoolRefusal& refusal) {
        if (!refusal.Unsupported()) Refuse("Cannot read the driver information of " + name, refusal);
    }
}

// ---------------------------------------------------------------- link

Backend::NicLink LinuxNics::GetLink(const std::string& name) {
    const auto link = Require(name);
    Backend::NicLink out;
    out.adminUp = link.up;
    // IFF_LOWER_UP: the kernel's carrier, only ever set on a device that is up.
    out.linkUp = link.lowerUp;
    out.linkStatusUp = link.operState == "up" || (link.operState == "unknown" && link.up && link.lowerUp);
    out.mac = link.mac;
    out.mtu = link.mtu;
    // Speed and duplex mean something only with a link: without one the NIC shows 0 and half
    // duplex, whatever a driver may report.
    if (out.linkUp) {
        if (auto modes = GetIfSupported(ETHTOOL_MSG_LINKMODES_GET, name, "the link modes")) {
            out.speed = SpeedOf(*modes);
            out.duplex = modes->Value(ETHTOOL_A_LINKMODES_DUPLEX, DUPLEX_UNKNOWN) == DUPLEX_FULL
                             ? Net::PNIC_DUPLEX_FULL
                             : Net::PNIC_DUPLEX_HALF;
        }
    }
    return out;
}

void LinuxNics::SetAdminUp(const std::string& name, bool up) {
    Require(name);
    context_.BeginChange();
    Kernel::LinkChange change;
    change.up = up;
    Kernel::ChangeLink(Own(), name, change);
    if (Kernel::DryRun()) return;  // a dry run changed nothing to read back
    const auto now = Require(name);
    if (now.up != up)
        throw HostCtlException(name + " is still " + (now.up ? "up" : "down") + " after it was brought " +
                               (up ? "up" : "down"));
}

// ---------------------------------------------------------------- general settings

// What the kernel has no notion of gets a value that says so: a NIC whose driver reports no
// link settings has no supported ports, port code 0xff (other: "Cable Type" is empty) and
// transceiver 0xff (neither internal nor external); a driver without Wake-on-LAN or a message
// level shows them unsupported. The virtual address is the MAC address the NIC uses when it is
// not its permanent (factory) address; empty when it is. A NIC without a permanent address
// (veth, most virtual devices) has only virtual addresses.
void LinuxNics::GetPnicInfo(const std::string& name, Net::PnicInfo& info) {
    const auto link = Require(name);
    info = Net::PnicInfo();
    info.port = PORT_OTHER;
    info.transceiver = 0xff;
    if (auto linkInfo = GetIfSupported(ETHTOOL_MSG_LINKINFO_GET, name, "the link settings")) {
        info.port = static_cast<std::uint32_t>(linkInfo->Value(ETHTOOL_A_LINKINFO_PORT, PORT_OTHER));
        info.phyAddress = static_cast<std::int64_t>(linkInfo->Value(ETHTOOL_A_LINKINFO_PHYADDR, 0));
        info.transceiver = static_cast<std::uint32_t>(linkInfo->Value(ETHTOOL_A_LINKINFO_TRANSCEIVER, 0xff));
    }
    if (auto modes = GetIfSupported(ETHTOOL_MSG_LINKMODES_GET, name, "the link modes")) {
        info.autoNegotiation = modes->Value(ETHTOOL_A_LINKMODES_AUTONEG, 0) == AUTONEG_ENABLE;
        if (const auto* ours = modes->Bitset(ETHTOOL_A_LINKMODES_OURS)) {
            // Listed bits are the supported modes; those that are on are advertised.
            for (const auto& bit : ours->bits) {
                if (bit.name == "Autoneg") {
                    info.supportsAutoNegotiation = true;
                    info.advertisedAutoNegotiation = bit.on;
                } else if (auto port = PortCode(bit.name)) {
                    info.supportedPorts.push_back(*port);
                } else if (auto mode = ParseLinkModeName(bit.name); mode && bit.on) {
                    info.advertisedLinkModes.push_back(*mode);
                }
            }
        }
    }
    // The kernel shows Wake-on-LAN (with its SecureOn password) to CAP_NET_ADMIN only: another
    // user sees it unsupported, and is told why.
    std::optional<Kernel::EthtoolReply> wol;
    try {
        wol = Ethtool().Get(ETHTOOL_MSG_WOL_GET, name);
    } catch (const Kernel::EthtoolRefusal& refusal) {
        if (refusal.Code() == EPERM) {
            context_.Warn("the Wake-on-LAN settings of " + name +
                          " are shown as unsupported: reading them needs root (CAP_NET_ADMIN)");
        } else if (!refusal.Unsupported()) {
            Refuse("Cannot read the Wake-on-LAN settings of " + name, refusal);
        }
    }
    if (wol) {
        if (const auto* modes = wol->Bitset(ETHTOOL_A_WOL_MODES)) {
            info.supportsWakeOn = modes->MaskWord() != 0;
            for (std::uint32_t mode = Net::WAKE_ON_PHY; mode <= Net::WAKE_ON_SECURE_ON; ++mode) {
                if (modes->Word() & (1u << mode)) info.wakeOn.push_back(static_cast<Net::WakeOnMode>(mode));
            }
        }
    }
    if (auto debug = GetIfSupported(ETHTOOL_MSG_DEBUG_GET, name, "the driver message level")) {
        info.messageLevelSupported = true;
        if (const auto* mask = debug->Bitset(ETHTOOL_A_DEBUG_MSGMASK)) info.messageLevel = mask->Word();
    }
    std::optional<std::string> permanent;
    try {
        permanent = Kernel::ReadPermanentAddress(name);
    } catch (const Kernel::EthtoolRefusal&) {
        // A driver that cannot say has no permanent address to compare with.
    }
    if (!permanent || *permanent != link.mac) info.virtualAddress = link.mac;
    info.linkStatus = link.lowerUp ? "Up" : "Down";
}

void LinuxNics::SetPnicInfo(const std::string& name, const Net::PnicInfo& info) {
    Require(name);
    // What no Linux NIC takes is refused before anything changes.
    if (info.transceiverChanged) {
        throw HostCtlException("Cannot change the transceiver of " + name +
                               ": the kernel reports the transceiver type but does not set it");
    }
    if (info.portChanged && info.port > 0xff)
        throw HostCtlException("Invalid port code " + std::to_string(info.port));
    if (info.phyAddressChanged && (info.phyAddress < 0 || info.phyAddress > 31))
        throw HostCtlException("PHY address " + std::to_string(info.phyAddress) +
                               " is out of range (0 to 31)");
    std::uint32_t wakeOn = 0;
    if (info.wakeOnChanged) {
        for (auto mode : info.wakeOn) {
            if (mode > Net::WAKE_ON_SECURE_ON)
                throw HostCtlException("Invalid Wake-on mode " + std::to_string(static_cast<unsigned>(mode)));
            wakeOn |= 1u << mode;
        }
    }
    if (info.messageLevelChanged && (info.messageLevel < 0 || info.messageLevel > 0xffffffffLL)) {
        throw HostCtlException("Message level " + std::to_string(info.messageLevel) +
                               " is out of range (0 to 4294967295)");
    }
    std::optional<std::string> mac;
    if (info.virtualAddressChanged) {
        if (info.virtualAddress.empty()) {
            // No virtual address: the NIC goes back to its permanent one.
            try {
                mac = Kernel::ReadPermanentAddress(name);
            } catch (const Kernel::EthtoolRefusal&) {
            }
            if (!mac)
                throw HostCtlException(name +
                                       " has no permanent MAC address to go back to: give a virtual address");
        } else if (!Net::MacAddress::IsValid(info.virtualAddress)) {
            throw HostCtlException("Invalid virtual address '" + info.virtualAddress +
                                   "': expected a unicast MAC address such as 02:00:00:00:00:01");
        } else {
            mac = Net::MacAddress(info.virtualAddress).GetStringAddress();
        }
    }
    if (!info.portChanged && !info.phyAddressChanged && !info.wakeOnChanged && !info.messageLevelChanged &&
        !mac)
        return;

    if (info.portChanged || info.phyAddressChanged || info.wakeOnChanged || info.messageLevelChanged)
        context_.RequireUndoable(Context::kDriverSettings);
    context_.BeginChange();
    // Each setting is its own request: when one is refused, those before it stay changed, and
    // the message says which.
    std::vector<std::string> done;
    auto step = [&](const std::string& what, const std::function<void()>& change) {
        try {
            change();
        } catch (const HostCtlException& e) {
            if (done.empty()) throw;
            throw HostCtlException(e.GetMessage() + " (already changed: " + Join(done) + ")");
        }
        done.push_back(what);
    };
    if (info.portChanged || info.phyAddressChanged) {
        std::map<int, std::uint32_t> values;
        if (info.portChanged) values[ETHTOOL_A_LINKINFO_PORT] = info.port;
        if (info.phyAddressChanged)
            values[ETHTOOL_A_LINKINFO_PHYADDR] = static_cast<std::uint32_t>(info.phyAddress);
        step("the port and PHY address", [&] {
            Change(Kernel::BuildEthtoolSet(Ethtool().Family(), ETHTOOL_MSG_LINKINFO_SET, name, values), name,
                   "the port and PHY address");
        });
    }
    if (info.wakeOnChanged) {
        step("Wake-on-LAN", [&] {
            Change(Kernel::BuildEthtoolBitsetSet(Ethtool().Family(), ETHTOOL_MSG_WOL_SET, name,
                                                 ETHTOOL_A_WOL_MODES, wakeOn),
                   name, "the Wake-on-LAN settings");
        });
    }
    if (info.messageLevelChanged) {
        step("the message level", [&] {
            Change(Kernel::BuildEthtoolBitsetSet(Ethtool().Family(), ETHTOOL_MSG_DEBUG_SET, name,
                                                 ETHTOOL_A_DEBUG_MSGMASK,
                                                 static_cast<std::uint32_t>(info.messageLevel)),
                   name, "the driver message level");
        });
    }
    if (mac) {
        step("the MAC address", [&] {
            Kernel::LinkChange change;
            change.mac = *mac;
            Kernel::ChangeLink(Own(), name, change);
        });
    }

    // The kernel's word on what it now holds.
    if (Kernel::DryRun()) return;  // a dry run changed nothing to read back
    Net::PnicInfo now;
    GetPnicInfo(name, now);
    auto differs = [&](const std::string& what, const std::string& asked, const std::string& holds) {
        throw HostCtlException(name + " holds " + what + " " + holds + " after it was set to " + asked);
    };
    if (info.portChanged && now.port != info.port)
        differs("port", std::to_string(info.port), std::to_string(now.port));
    if (info.phyAddressChanged && now.phyAddress != info.phyAddress)
        differs("PHY address", std::to_string(info.phyAddress), std::to_string(now.phyAddress));
    if (info.wakeOnChanged) {
        std::uint32_t holds = 0;
        for (auto mode : now.wakeOn)
            holds |= 1u << mode;
        if (holds != wakeOn) {
            std::vector<std::string> asked, held;
            for (std::uint32_t mode = 0; mode <= Net::WAKE_ON_SECURE_ON; ++mode) {
                if (wakeOn & (1u << mode)) asked.push_back(WakeOnName(mode));
                if (holds & (1u << mode)) held.push_back(WakeOnName(mode));
            }
            differs("Wake-on", asked.empty() ? "none" : Join(asked), held.empty() ? "none" : Join(held));
        }
    }
    if (info.messageLevelChanged && now.messageLevel != info.messageLevel)
        differs("message level", std::to_string(info.messageLevel), std::to_string(now.messageLevel));
    if (mac) {
        const std::string holds = Lower(Require(name).mac);
        if (holds != *mac) differs("MAC address", *mac, holds);
    }
}

void LinuxNics::SetSpeedDuplex(const std::string& name, std::uint32_t speed, std::uint32_t duplex) {
    Require(name);
    const bool automatic = speed == 0 && duplex == Net::PNIC_DUPLEX_AUTO;
    if (!automatic && (speed == 0 || (duplex != Net::PNIC_DUPLEX_FULL && duplex != Net::PNIC_DUPLEX_HALF))) {
        throw HostCtlException("Invalid speed and duplex " + std::to_string(speed) + "/" +
                               std::to_string(duplex) +
                               ": give a speed in Mbps with full (1) or half (2) duplex, or 0/0 for "
                               "auto-negotiation");
    }
    context_.RequireUndoable(Context::kDriverSettings);
    context_.BeginChange();
    std::map<int, std::uint32_t> values{
        {ETHTOOL_A_LINKMODES_AUTONEG, automatic ? AUTONEG_ENABLE : AUTONEG_DISABLE}};
    const std::string what = automatic ? "auto-negotiation" : "the speed and duplex";
    if (!automatic) {
        values[ETHTOOL_A_LINKMODES_SPEED] = speed;
        values[ETHTOOL_A_LINKMODES_DUPLEX] = duplex == Net::PNIC_DUPLEX_FULL ? DUPLEX_FULL : DUPLEX_HALF;
    }
    Change(Kernel::BuildEthtoolSet(Ethtool().Family(), ETHTOOL_MSG_LINKMODES_SET, name, values), name, what);
    if (Kernel::DryRun()) return;  // a dry run changed nothing to read back

    // Read back: the negotiation mode always; a forced speed and duplex while there is a link
    // (without one drivers report neither).
    const auto modes = Get(ETHTOOL_MSG_LINKMODES_GET, name, "the link modes");
    const bool autoneg = modes.Value(ETHTOOL_A_LINKMODES_AUTONEG, 0) == AUTONEG_ENABLE;
    if (autoneg != automatic)
        throw HostCtlException(name + " has auto-negotiation " + (autoneg ? "on" : "off") +
                               " after it was set " + (automatic ? "on" : "off"));
    const auto linkSpeed = SpeedOf(modes);
    const auto linkDuplex = modes.Value(ETHTOOL_A_LINKMODES_DUPLEX, DUPLEX_UNKNOWN);
    if (!automatic && Require(name).lowerUp && linkSpeed != 0 && linkDuplex != DUPLEX_UNKNOWN &&
        (linkSpeed != speed || (linkDuplex == DUPLEX_FULL) != (duplex == Net::PNIC_DUPLEX_FULL))) {
        throw HostCtlException(name + " runs at " + std::to_string(linkSpeed) + " Mbps " +
                               (linkDuplex == DUPLEX_FULL ? "full" : "half") +
                               " duplex after it was set to " + std::to_string(speed) + " Mbps " +
                               (duplex == Net::PNIC_DUPLEX_FULL ? "full" : "half") + " duplex");
    }
}

std::unique_ptr<Backend::Nics> MakeNics(Context& context) {
    return std::make_unique<LinuxNics>(context);
}

}  // namespace TknCtl::Linux

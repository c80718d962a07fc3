// The SR-IOV NICs of the Linux host and their virtual functions.
//
// An SR-IOV NIC is a physical NIC (network/pnic.h) whose device has the SR-IOV capability:
// sysfs shows its sriov_totalvfs, and it is more than 0 (a device whose driver allows no VF
// cannot have any). The representors of a device's VFs (switchdev mode) share its device but
// are no NICs with VFs of their own: they are left out. A NIC's VFs are its device's virtfnN
// links (N is the VF ID): those enabled now (sriov_numvfs), so a NIC with SR-IOV enabled in its
// driver but no VF has none. The library names VFs with 8 bits: a VF numbered above 255 is
// left out, with a warning.
//
// Whether a VF is in use and by what is read from what the kernel shows of it (DecideVfUse in
// network/sriov.h): the process that holds its VFIO or UIO device open owns it (a virtual
// machine's emulator: its PID stands for the world of the VM); a VF a driver of the kernel
// drives is in use by the host while its interface is up. Seeing which process holds a device
// needs leave to read that process's descriptors: without root a VF handed to a process of
// another user is shown as not in use, and the user is told so.
//
// Counters come from rtnetlink (IFLA_VF_STATS); a driver that reports no counters of its VFs
// is refused with a message naming it.
#include "network/sriov.h"

#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <set>

#include "hostctl/exception.h"
#include "network/pnic.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;
namespace Net = HostCtl::Network;

// ---------------------------------------------------------------- what a VF's use is

bool IsFunctionRepresentor(const std::string& portName) {
    // [c<controller>]pf<number>vf<number> or ...sf<number>.
    for (auto at = portName.find("pf"); at != std::string::npos; at = portName.find("pf", at + 2)) {
        std::size_t end = at + 2;
        while (end < portName.size() && std::isdigit(static_cast<unsigned char>(portName[end])))
            ++end;
        if (end == at + 2 || end + 2 >= portName.size()) continue;
        if ((portName.compare(end, 2, "vf") == 0 || portName.compare(end, 2, "sf") == 0) &&
            std::isdigit(static_cast<unsigned char>(portName[end + 2])))
            return true;
    }
    return false;
}

bool IsUserSpaceDriver(const std::string& driver) {
    // vfio-pci and its variants for particular devices (mlx5_vfio_pci, ...).
    return driver.find("vfio") != std::string::npos || driver == "pci-stub" || driver == "uio_pci_generic" ||
           driver == "igb_uio";
}

std::vector<std::string> VfDeviceFiles(const Kernel::VirtualFunction& vf) {
    std::vector<std::string> files;
    // A VFIO driver makes the device's IOMMU group a device file of its own.
    if (!vf.iommuGroup.empty() && vf.driver.find("vfio") != std::string::npos) {
        files.push_back("/dev/vfio/" + vf.iommuGroup);
        files.push_back("/dev/vfio/noiommu-" + vf.iommuGroup);
    }
    for (const auto& device : vf.userDevices)
        files.push_back("/dev/" + device);
    return files;
}

VfUse DecideVfUse(const Kernel::VirtualFunction& vf, std::optional<Kernel::VfLinkState> linkState,
                  const std::map<std::string, Kernel::Process>& holders,
                  const std::map<std::string, bool>& interfacesUp) {
    VfUse use;
    if (vf.driver.empty()) return use;
    const bool linkHeldDown = linkState == Kernel::VfLinkState::kDisable;
    std::optional<std::uint32_t> owner;
    for (const auto& file : VfDeviceFiles(vf)) {
        auto holder = holders.find(file);
        if (holder != holders.end() && (!owner || holder->second.pid < *owner)) owner = holder->second.pid;
    }
    if (owner) {
        use.owner = std::to_string(*owner);
        use.active = !linkHeldDown;
        return use;
    }
    if (IsUserSpaceDriver(vf.driver)) return use;
    bool seen = false, up = false;
    for (const auto& name : vf.interfaces) {
        auto it = interfacesUp.find(name);
        if (it == interfacesUp.end()) continue;
        seen = true;
        up = up || it->second;
    }
    use.active = (!seen || up) && !linkHeldDown;
    return use;
}

Net::SriovNicVFStats VfStatsOf(const Kernel::VfCounters& c) {
    Net::SriovNicVFStats stats;
    const std::uint64_t other = c.multicast + c.broadcast;
    stats.rxUnicastPkts = c.rxPackets > other ? c.rxPackets - other : 0;
    stats.rxUnicastBytes = c.rxBytes;
    stats.rxMulticastPkts = c.multicast;
    stats.rxBroadcastPkts = c.broadcast;
    stats.rxOutOfBufferDrops = c.rxDropped;
    stats.txUnicastPkts = c.txPackets;
    stats.txUnicastBytes = c.txBytes;
    stats.txDiscards = c.txDropped;
    return stats;
}

// ---------------------------------------------------------------- the area

namespace {

// The SR-IOV capability of a NIC's device; nothing for a NIC that is no SR-IOV NIC.
std::optional<Kernel::SriovFunction> SriovOf(const std::string& sysfs, const std::string& name) {
    auto sriov = Kernel::ReadSriov(sysfs, name);
    if (sriov && IsFunctionRepresentor(Kernel::PhysicalPortName(sysfs, name))) return std::nullopt;
    if (!sriov || sriov->totalVfs == 0) return std::nullopt;
    return sriov;
}

std::string NotSriov(const std::string& name) {
    return name + " is not an SR-IOV enabled NIC";
}

}  // namespace

std::vector<std::string> LinuxNics::ListSriovNics() {
    std::vector<std::string> names;
    for (auto& name : List()) {
        if (SriovOf(sysfs_, name)) names.push_back(std::move(name));
    }
    return names;
}

bool LinuxNics::IsSriovNic(const std::string& name) {
    return Has(name) && SriovOf(sysfs_, name);
}

std::vector<Net::SriovNicVFInfo> LinuxNics::GetSriovNicVFInfo(const std::string& name) {
    const auto link = Require(name);
    const auto sriov = SriovOf(sysfs_, name);
    if (!sriov) throw HostCtlException(NotSriov(name));
    std::vector<Net::SriovNicVFInfo> vfs;
    if (sriov->vfs.empty()) return vfs;

    // What the kernel says of the VFs' links, the holders of their device files and the state
    // of their interfaces here.
    const auto kernel = Kernel::ReadVfs(Own(), link.index, false, name);
    std::set<std::string> files;
    for (const auto& vf : sriov->vfs) {
        for (auto& file : VfDeviceFiles(vf))
            files.insert(std::move(file));
    }
    if (!files.empty() && geteuid() != 0) {
        context_.Warn(
            "a VF handed to a process of another user is shown as not in use: seeing who holds a VF "
            "needs root");
    }
    const auto holders = Kernel::FileHolders(files);
    std::map<std::string, bool> interfacesUp;
    for (const auto& each : Kernel::ListLinks(Own(), false))
        interfacesUp[each.name] = each.up;

    for (const auto& vf : sriov->vfs) {
        if (vf.number > 255) {
            context_.Warn("VF " + std::to_string(vf.number) + " of " + name +
                          " is left out: VF IDs above 255 cannot be shown");
            continue;
        }
        std::optional<Kernel::VfLinkState> linkState;
        for (const auto& config : kernel.vfs) {
            if (config.number == vf.number) linkState = config.linkState;
        }
        const auto use = DecideVfUse(vf, linkState, holders, interfacesUp);
        Net::SriovNicVFInfo info;
        info.vfId = static_cast<std::uint8_t>(vf.number);
        info.active = use.active;
        info.pciAddress = vf.pciAddress;
        info.ownerWorldId = use.owner;
        vfs.push_back(std::move(info));
    }
    return vfs;
}

void LinuxNics::GetSriovNicVFStats(const std::string& name, std::uint8_t vfId, Net::SriovNicVFStats& stats) {
    const auto link = Require(name);
    const auto sriov = SriovOf(sysfs_, name);
    if (!sriov) throw HostCtlException(NotSriov(name));
    const auto id = static_cast<std::uint32_t>(vfId);
    if (std::none_of(sriov->vfs.begin(), sriov->vfs.end(),
                     [&](const Kernel::VirtualFunction& vf) { return vf.number == id; }))
        throw HostCtlException(name + " has no VF " + std::to_string(id));
    const auto kernel = Kernel::ReadVfs(Own(), link.index, true, name);
    for (const auto& config : kernel.vfs) {
        if (config.number != id || !config.counters) continue;
        stats = VfStatsOf(*config.counters);
        return;
    }
    throw HostCtlException("The driver of " + name + " (" + DriverOf(name) + ") reports no counters of VF " +
                           std::to_string(id));
}

}  // namespace TknCtl::Linux

#include "kernel/sysfs.h"

#include <dirent.h>
#include <limits.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <charconv>
#include <fstream>
#include <istream>
#include <vector>

namespace TknCtl::Linux::Kernel {

namespace {

// An interface name as a path component: what the kernel would never name a device is
// refused here rather than followed.
bool SafeName(const std::string& name) {
    return !name.empty() && name != "." && name != ".." && name.find('/') == std::string::npos;
}

std::string RealPath(const std::string& path) {
    char resolved[PATH_MAX];
    if (!realpath(path.c_str(), resolved)) return {};
    return resolved;
}

std::string Basename(const std::string& path) {
    const auto slash = path.rfind('/');
    return slash == std::string::npos ? path : path.substr(slash + 1);
}

std::string Parent(const std::string& path) {
    const auto slash = path.rfind('/');
    return slash == std::string::npos || slash == 0 ? std::string("/") : path.substr(0, slash);
}

// The first line of a small attribute file, without its newline; empty when it is absent.
std::string ReadLine(const std::string& path) {
    std::ifstream in(path);
    std::string line;
    std::getline(in, line);
    while (!line.empty() && (line.back() == '\n' || line.back() == '\r' || line.back() == ' '))
        line.pop_back();
    return line;
}

// "0x8086" -> "8086".
std::string HexId(const std::string& text) {
    std::string id = text.rfind("0x", 0) == 0 ? text.substr(2) : text;
    for (auto& c : id)
        c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    return id;
}

std::string Subsystem(const std::string& device) {
    return Basename(RealPath(device + "/subsystem"));
}

std::string Lower(std::string text) {
    for (auto& c : text)
        c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    return text;
}

// The last component of what a symbolic link points to (a driver's name, an IOMMU group's
// number); empty when there is no such link.
std::string LinkName(const std::string& path) {
    char target[PATH_MAX];
    const ssize_t length = readlink(path.c_str(), target, sizeof(target));
    if (length <= 0 || static_cast<std::size_t>(length) >= sizeof(target)) return {};
    return Basename(std::string(target, static_cast<std::size_t>(length)));
}

// The names of a directory's entries (without "." and ".."), in name order; none when it
// cannot be read.
std::vector<std::string> Entries(const std::string& path) {
    std::vector<std::string> names;
    if (DIR* dir = opendir(path.c_str())) {
        while (const dirent* entry = readdir(dir)) {
            const std::string name = entry->d_name;
            if (name != "." && name != "..") names.push_back(name);
        }
        closedir(dir);
    }
    std::sort(names.begin(), names.end());
    return names;
}

// The decimal number that is the whole text, or nothing.
std::optional<std::uint32_t> Number(const std::string& text) {
    std::uint32_t value = 0;
    if (text.empty()) return std::nullopt;
    auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
    return value;
}

}  // namespace

bool HasNetDevice(const std::string& root, const std::string& interface) {
    if (!SafeName(interface)) return false;
    struct stat info {};
    return stat((root + "/class/net/" + interface + "/device").c_str(), &info) == 0;
}

std::optional<NetDevice> ReadNetDevice(const std::string& root, const std::string& interface) {
    if (!HasNetDevice(root, interface)) return std::nullopt;
    const std::string device = RealPath(root + "/class/net/" + interface + "/device");
    if (device.empty()) return std::nullopt;
    NetDevice out;
    out.name = Basename(device);
    out.subsystem = Subsystem(device);
    const std::string top = RealPath(root);
    // The PCI function: the device itself or its nearest ancestor on the PCI bus.
    for (std::string dir = device; dir.size() > top.size() && dir.rfind(top, 0) == 0; dir = Parent(dir)) {
        if (Subsystem(dir) == "pci") {
            out.pciAddress = Basename(dir);
            out.vendorId = HexId(ReadLine(dir + "/vendor"));
            out.deviceId = HexId(ReadLine(dir + "/device"));
            break;
        }
    }
    if (out.subsystem == "pci") {
        out.bus = NetDevice::Bus::kPci;
    } else if (out.subsystem == "usb") {
        // The interface of a USB device: the device (its parent) says what it is.
        out.bus = NetDevice::Bus::kUsb;
        const std::string usb = Parent(device);
        out.vendorId = HexId(ReadLine(usb + "/idVendor"));
        out.deviceId = HexId(ReadLine(usb + "/idProduct"));
        out.vendorName = ReadLine(usb + "/manufacturer");
        out.deviceName = ReadLine(usb + "/product");
    } else if (!out.pciAddress.empty()) {
        out.bus = NetDevice::Bus::kPci;  // virtio and the like: the PCI function is the adapter
    }
    return out;
}

std::pair<std::string, std::string> FindPciNames(std::istream& ids, const std::string& vendorId,
                                                 const std::string& deviceId) {
    const std::string vendor = Lower(vendorId), device = Lower(deviceId);
    std::pair<std::string, std::string> names;
    bool inVendor = false;
    for (std::string line; std::getline(ids, line);) {
        if (line.empty() || line[0] == '#') continue;
        if (line[0] != '\t') {
            if (inVendor) break;  // the next vendor: the device is not listed
            // "C xx  class" sections follow the vendors: nothing further to find.
            if (line.rfind("C ", 0) == 0) break;
            if (line.size() > 6 && Lower(line.substr(0, 4)) == vendor && line.compare(4, 2, "  ") == 0) {
                names.first = line.substr(6);
                inVendor = true;
            }
        } else if (inVendor && line.size() > 7 && line[1] != '\t' && Lower(line.substr(1, 4)) == device &&
                   line.compare(5, 2, "  ") == 0) {
            names.second = line.substr(7);
            break;
        }
    }
    return names;
}

std::pair<std::string, std::string> LookupPciNames(const std::string& vendorId, const std::string& deviceId) {
    for (const char* path : {"/usr/share/misc/pci.ids", "/usr/share/hwdata/pci.ids", "/usr/share/pci.ids"}) {
        std::ifstream ids(path);
        if (ids) return FindPciNames(ids, vendorId, deviceId);
    }
    return {};
}

std::pair<std::uint32_t, std::uint32_t> QueueCounts(const std::string& root, const std::string& interface) {
    std::pair<std::uint32_t, std::uint32_t> counts{0, 0};
    if (!SafeName(interface)) return counts;
    DIR* dir = opendir((root + "/class/net/" + interface + "/queues").c_str());
    if (!dir) return counts;
    while (const dirent* entry = readdir(dir)) {
        const std::string name = entry->d_name;
        if (name.rfind("rx-", 0) == 0) ++counts.first;
        if (name.rfind("tx-", 0) == 0) ++counts.second;
    }
    closedir(dir);
    return counts;
}

std::optional<SriovFunction> ReadSriov(const std::string& root, const std::string& interface) {
    if (!HasNetDevice(root, interface)) return std::nullopt;
    const std::string device = root + "/class/net/" + interface + "/device";
    const auto total = Number(ReadLine(device + "/sriov_totalvfs"));
    if (!total) return std::nullopt;
    SriovFunction out;
    out.totalVfs = *total;
    out.numVfs = Number(ReadLine(device + "/sriov_numvfs")).value_or(0);
    for (const auto& entry : Entries(device)) {
        if (entry.rfind("virtfn", 0) != 0) continue;
        const auto number = Number(entry.substr(6));
        const std::string vf = device + "/" + entry;
        const std::string function = Basename(RealPath(vf));
        if (!number || function.empty()) continue;  // not a VF's link, or one that leads nowhere
        VirtualFunction v;
        v.number = *number;
        v.pciAddress = function;
        v.driver = LinkName(vf + "/driver");
        v.interfaces = Entries(vf + "/net");
        v.iommuGroup = LinkName(vf + "/iommu_group");
        for (const auto& name : Entries(vf + "/vfio-dev"))
            v.userDevices.push_back("vfio/devices/" + name);
        for (const auto& name : Entries(vf + "/uio"))
            v.userDevices.push_back(name);
        out.vfs.push_back(std::move(v));
    }
    std::sort(out.vfs.begin(), out.vfs.end(),
              [](const VirtualFunction& a, const VirtualFunction& b) { return a.number < b.number; });
    return out;
}

std::string PhysicalPortName(const std::string& root, const std::string& interface) {
    if (!SafeName(interface)) return {};
    return ReadLine(root + "/class/net/" + interface + "/phys_port_name");
}

std::optional<bool> BridgeVlanStatsEnabled(const std::string& root, const std::string& bridge) {
    if (!SafeName(bridge)) return std::nullopt;
    const std::string value = ReadLine(root + "/class/net/" + bridge + "/bridge/vlan_stats_enabled");
    if (value.empty()) return std::nullopt;
    return value != "0";
}

}  // namespace TknCtl::Linux::Kernel

// What sysfs says of network devices: the hardware behind an interface (a PCI function, a USB
// adapter, ...), its queues, and the options of bridges. Every function takes the root of
// sysfs ("/sys" on a host) so that tests give it a tree of their own.
#pragma once

#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>
#include <utility>

namespace TknCtl::Linux::Kernel {

constexpr const char* kSysfs = "/sys";

// The device behind a network interface (/sys/class/net/NAME/device).
struct NetDevice {
    enum class Bus { kPci, kUsb, kOther };
    Bus bus = Bus::kOther;
    // The bus of the device itself ("pci", "usb", "virtio", "platform", ...) and its name there.
    std::string subsystem;
    std::string name;
    // The PCI function that carries it: the device itself or the nearest PCI ancestor (a
    // virtio device sits on one). Empty when there is none.
    std::string pciAddress;
    // PCI: vendor and device IDs ("8086", "10d3"); USB: idVendor and idProduct.
    std::string vendorId, deviceId;
    // USB: the adapter's own manufacturer and product strings, where it has them.
    std::string vendorName, deviceName;
};

// Whether an interface is backed by a device (the mark of a physical NIC).
bool HasNetDevice(const std::string& root, const std::string& interface);
// The device behind an interface; nothing when it has none (a virtual interface).
std::optional<NetDevice> ReadNetDevice(const std::string& root, const std::string& interface);

// The names of a PCI vendor and device in a pci.ids database (the format of the PCI ID
// Repository: "VVVV  Vendor" lines, each followed by "\tDDDD  Device" lines); empty texts for
// what it does not list.
std::pair<std::string, std::string> FindPciNames(std::istream& ids, const std::string& vendorId,
                                                 const std::string& deviceId);
// The same from the system's database (/usr/share/misc/pci.ids, /usr/share/hwdata/pci.ids).
std::pair<std::string, std::string> LookupPciNames(const std::string& vendorId, const std::string& deviceId);

// The RX and TX queues the interface uses now (its queues/rx-N and queues/tx-N entries).
std::pair<std::uint32_t, std::uint32_t> QueueCounts(const std::string& root, const std::string& interface);

// Whether a bridge counts traffic per VLAN (its vlan_stats_enabled option); nothing when the
// kernel has no bridge VLAN filtering, and so no such counters.
std::optional<bool> BridgeVlanStatsEnabled(const std::string& root, const std::string& bridge);

}  // namespace TknCtl::Linux::Kernel

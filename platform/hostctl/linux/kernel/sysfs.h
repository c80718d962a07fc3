// What sysfs says of network devices: the hardware behind an interface (a PCI function, a USB
// adapter, ...), its queues, the virtual functions of an SR-IOV device, and the options of
// bridges. Every function takes the root of sysfs ("/sys" on a host) so that tests give it a
// tree of their own.
#pragma once

#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>
#include <utility>
#include <vector>

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

// A virtual function of an SR-IOV device: the device's virtfnN link.
struct VirtualFunction {
    std::uint32_t number = 0;  // N of virtfnN: the VF's number in rtnetlink's VF attributes
    std::string pciAddress;    // its own PCI function ("0000:3b:02.0")
    std::string driver;        // the driver bound to it ("iavf", "vfio-pci"); empty: none
    // Its network interfaces, as far as this sysfs shows them: those of the namespace that
    // mounted it (an interface moved to another namespace is not seen).
    std::vector<std::string> interfaces;
    std::string iommuGroup;  // the number of its IOMMU group; empty without an IOMMU
    // The device files through which user space drives it, below /dev: its VFIO device
    // ("vfio/devices/vfio3", from vfio-dev/) and its UIO devices ("uio0", from uio/).
    std::vector<std::string> userDevices;
};

// The SR-IOV capability of a PCI device (a physical function).
struct SriovFunction {
    std::uint32_t totalVfs = 0;        // sriov_totalvfs: the most VFs the device (and its driver) offer
    std::uint32_t numVfs = 0;          // sriov_numvfs: the VFs enabled now
    std::vector<VirtualFunction> vfs;  // the virtfnN links, by number
};

// The SR-IOV capability of the device behind an interface; nothing when the device has none
// (no sriov_totalvfs, or one that is no number) or the interface has no device.
std::optional<SriovFunction> ReadSriov(const std::string& root, const std::string& interface);

// The name the driver gives the interface's port (phys_port_name: "p0", "pf0vf3"); empty when
// it gives none.
std::string PhysicalPortName(const std::string& root, const std::string& interface);

// Whether a bridge counts traffic per VLAN (its vlan_stats_enabled option); nothing when the
// kernel has no bridge VLAN filtering, and so no such counters.
std::optional<bool> BridgeVlanStatsEnabled(const std::string& root, const std::string& bridge);

}  // namespace TknCtl::Linux::Kernel

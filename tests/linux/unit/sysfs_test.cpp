// sysfs read from trees of the test's own, laid out as the kernel lays them out: the device
// behind an interface (a PCI function, a virtio device on one, a USB adapter, none), queues,
// bridge options, and PCI names from a pci.ids database.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <sstream>

#include "kernel/sysfs.h"

namespace {

namespace K = TknCtl::Linux::Kernel;
namespace fs = std::filesystem;

class SysfsTest : public ::testing::Test {
protected:
    void SetUp() override {
        std::string pattern = (fs::temp_directory_path() / "hadro-sysfs-XXXXXX").string();
        ASSERT_NE(mkdtemp(pattern.data()), nullptr);
        root_ = pattern;
        for (const char* bus : {"pci", "usb", "virtio"})
            fs::create_directories(root_ + "/bus/" + bus);
        fs::create_directories(root_ + "/class/net");
    }
    void TearDown() override { fs::remove_all(root_); }

    void Write(const std::string& path, const std::string& text) {
        fs::create_directories(fs::path(root_ + "/" + path).parent_path());
        std::ofstream(root_ + "/" + path) << text;
    }
    void Link(const std::string& target, const std::string& path) {
        fs::create_directories(fs::path(root_ + "/" + path).parent_path());
        fs::create_symlink(target, root_ + "/" + path);
    }
    // A device directory on a bus, as /sys/devices holds it.
    void Device(const std::string& dir, const std::string& bus) {
        fs::create_directories(root_ + "/" + dir);
        Link(root_ + "/bus/" + bus, dir + "/subsystem");
    }
    // An interface under a device (or a virtual one when device is empty).
    void Interface(const std::string& name, const std::string& device) {
        const std::string dir = (device.empty() ? "devices/virtual" : device) + "/net/" + name;
        fs::create_directories(root_ + "/" + dir);
        if (!device.empty()) Link(root_ + "/" + device, dir + "/device");
        Link(root_ + "/" + dir, "class/net/" + name);
    }

    std::string root_;
};

TEST_F(SysfsTest, FindsThePciFunctionBehindAnInterfaceOrItsParent) {
    Device("devices/pci0000:00/0000:04:00.0", "pci");
    Write("devices/pci0000:00/0000:04:00.0/vendor", "0x8086\n");
    Write("devices/pci0000:00/0000:04:00.0/device", "0x10D3\n");
    Interface("eth0", "devices/pci0000:00/0000:04:00.0");
    Device("devices/pci0000:00/0000:00:03.0", "pci");
    Write("devices/pci0000:00/0000:00:03.0/vendor", "0x1af4\n");
    Write("devices/pci0000:00/0000:00:03.0/device", "0x1000\n");
    Device("devices/pci0000:00/0000:00:03.0/virtio0", "virtio");
    Interface("ens3", "devices/pci0000:00/0000:00:03.0/virtio0");

    ASSERT_TRUE(K::HasNetDevice(root_, "eth0"));
    auto eth0 = K::ReadNetDevice(root_, "eth0");
    ASSERT_TRUE(eth0);
    EXPECT_EQ(eth0->bus, K::NetDevice::Bus::kPci);
    EXPECT_EQ(eth0->pciAddress, "0000:04:00.0");
    EXPECT_EQ(eth0->vendorId, "8086");
    EXPECT_EQ(eth0->deviceId, "10d3");

    auto ens3 = K::ReadNetDevice(root_, "ens3");
    ASSERT_TRUE(ens3);
    EXPECT_EQ(ens3->subsystem, "virtio");
    EXPECT_EQ(ens3->name, "virtio0");
    EXPECT_EQ(ens3->bus, K::NetDevice::Bus::kPci);
    EXPECT_EQ(ens3->pciAddress, "0000:00:03.0");
    EXPECT_EQ(ens3->vendorId, "1af4");
}

TEST_F(SysfsTest, UsbAdaptersVirtualInterfacesAndNamesThatAreNoInterfaces) {
    Device("devices/pci0000:00/0000:00:14.0", "pci");
    Device("devices/pci0000:00/0000:00:14.0/usb1/1-2", "usb");
    Write("devices/pci0000:00/0000:00:14.0/usb1/1-2/idVendor", "0bda\n");
    Write("devices/pci0000:00/0000:00:14.0/usb1/1-2/idProduct", "8153\n");
    Write("devices/pci0000:00/0000:00:14.0/usb1/1-2/product", "USB 10/100/1000 LAN\n");
    Device("devices/pci0000:00/0000:00:14.0/usb1/1-2/1-2:1.0", "usb");
    Interface("usb0", "devices/pci0000:00/0000:00:14.0/usb1/1-2/1-2:1.0");
    Interface("veth0", "");

    auto usb0 = K::ReadNetDevice(root_, "usb0");
    ASSERT_TRUE(usb0);
    EXPECT_EQ(usb0->bus, K::NetDevice::Bus::kUsb);
    EXPECT_EQ(usb0->vendorId, "0bda");
    EXPECT_EQ(usb0->vendorName, "");  // the adapter has no manufacturer string
    EXPECT_EQ(usb0->deviceName, "USB 10/100/1000 LAN");
    EXPECT_EQ(usb0->pciAddress, "0000:00:14.0");  // its host controller, not the adapter

    EXPECT_FALSE(K::HasNetDevice(root_, "veth0"));
    EXPECT_FALSE(K::ReadNetDevice(root_, "veth0"));
    for (const char* name : {"", ".", "..", "../class/net/usb0", "nowhere"}) {
        EXPECT_FALSE(K::HasNetDevice(root_, name)) << name;
        EXPECT_FALSE(K::ReadNetDevice(root_, name)) << name;
    }
}

TEST_F(SysfsTest, QueuesAndBridgeVlanCounters) {
    Interface("veth0", "");
    for (const char* queue : {"rx-0", "rx-1", "rx-2", "tx-0", "tx-1"})
        fs::create_directories(root_ + "/class/net/veth0/queues/" + queue);
    EXPECT_EQ(K::QueueCounts(root_, "veth0"), (std::pair<std::uint32_t, std::uint32_t>{3, 2}));
    EXPECT_EQ(K::QueueCounts(root_, "nowhere"), (std::pair<std::uint32_t, std::uint32_t>{0, 0}));

    Interface("br0", "");
    Write("class/net/br0/bridge/vlan_stats_enabled", "1\n");
    Interface("br1", "");
    Write("class/net/br1/bridge/vlan_stats_enabled", "0\n");
    Interface("br2", "");
    fs::create_directories(root_ + "/class/net/br2/bridge");  // a kernel without VLAN filtering
    EXPECT_EQ(K::BridgeVlanStatsEnabled(root_, "br0"), true);
    EXPECT_EQ(K::BridgeVlanStatsEnabled(root_, "br1"), false);
    EXPECT_EQ(K::BridgeVlanStatsEnabled(root_, "br2"), std::nullopt);
    EXPECT_EQ(K::BridgeVlanStatsEnabled(root_, "../br0"), std::nullopt);
}

TEST(PciIds, FindsVendorAndDeviceOfThatVendorOnly) {
    std::istringstream ids(
        "# comment\n"
        "1af4  Red Hat, Inc.\n"
        "\t1000  Virtio network device\n"
        "\t\t1af4 0001  a subsystem line\n"
        "8086  Intel Corporation\n"
        "\t10d3  82574L Gigabit Network Connection\n"
        "\t1000  not the virtio one\n"
        "C 02  Network controller\n");
    EXPECT_EQ(K::FindPciNames(ids, "1AF4", "1000"),
              (std::pair<std::string, std::string>{"Red Hat, Inc.", "Virtio network device"}));
    ids.clear();
    ids.seekg(0);
    EXPECT_EQ(
        K::FindPciNames(ids, "8086", "10d3"),
        (std::pair<std::string, std::string>{"Intel Corporation", "82574L Gigabit Network Connection"}));
    ids.clear();
    ids.seekg(0);
    EXPECT_EQ(K::FindPciNames(ids, "8086", "ffff"),
              (std::pair<std::string, std::string>{"Intel Corporation", ""}));
    ids.clear();
    ids.seekg(0);
    EXPECT_EQ(K::FindPciNames(ids, "dead", "0001"), (std::pair<std::string, std::string>{}));
}

}  // namespace

// SR-IOV below the kernel: a physical function's VFs in a sysfs tree of the test's own, links
// with VF information built in memory, the holders of device files in a /proc tree of the
// test's own, and what the NIC area makes of them (which VF is in use, and by whom; counters).
#include <arpa/inet.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <memory>

#include "kernel/processes.h"
#include "kernel/sysfs.h"
#include "kernel/vfs.h"
#include "network/sriov.h"

namespace {

namespace K = TknCtl::Linux::Kernel;
namespace L = TknCtl::Linux;
namespace fs = std::filesystem;
using Message = std::unique_ptr<nl_msg, void (*)(nl_msg*)>;

class SriovTreeTest : public ::testing::Test {
protected:
    void SetUp() override {
        std::string pattern = (fs::temp_directory_path() / "hadro-sriov-XXXXXX").string();
        ASSERT_NE(mkdtemp(pattern.data()), nullptr);
        root_ = pattern;
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
    std::string root_;
};

TEST_F(SriovTreeTest, ReadsThePhysicalFunctionAndItsVirtualFunctions) {
    const std::string pf = "devices/pci0000:3a/0000:3b:00.0";
    auto vf = [&](const std::string& address) { return root_ + "/devices/pci0000:3a/" + address; };
    fs::create_directories(root_ + "/" + pf + "/net/pf0");
    Link(root_ + "/" + pf, pf + "/net/pf0/device");
    Link(root_ + "/" + pf + "/net/pf0", "class/net/pf0");
    Write(pf + "/sriov_totalvfs", "64\n");
    Write(pf + "/sriov_numvfs", "12\n");
    // VF 0 handed to VFIO, VF 2 driven by the kernel, VF 10 without a driver (after VF 2: by
    // number, not by name), and links that are no VFs.
    Link(vf("0000:3b:02.0"), pf + "/virtfn0");
    Link(root_ + "/bus/pci/drivers/vfio-pci", "devices/pci0000:3a/0000:3b:02.0/driver");
    Link(root_ + "/kernel/iommu_groups/77", "devices/pci0000:3a/0000:3b:02.0/iommu_group");
    fs::create_directories(vf("0000:3b:02.0") + "/vfio-dev/vfio3");
    Link(vf("0000:3b:02.2"), pf + "/virtfn2");
    Link(root_ + "/bus/pci/drivers/iavf", "devices/pci0000:3a/0000:3b:02.2/driver");
    fs::create_directories(vf("0000:3b:02.2") + "/net/enp59s2f2");
    fs::create_directories(vf("0000:3b:02.2") + "/uio/uio1");
    Link(vf("0000:3b:03.2"), pf + "/virtfn10");
    fs::create_directories(vf("0000:3b:03.2"));
    Link(vf("0000:3b:09.0"), pf + "/virtfn11");  // leads nowhere
    Link(vf("0000:3b:02.0"), pf + "/virtfnx");

    auto sriov = K::ReadSriov(root_, "pf0");
    ASSERT_TRUE(sriov);
    EXPECT_EQ(sriov->totalVfs, 64u);
    EXPECT_EQ(sriov->numVfs, 12u);
    ASSERT_EQ(sriov->vfs.size(), 3u);
    const auto& v0 = sriov->vfs[0];
    EXPECT_EQ(v0.number, 0u);
    EXPECT_EQ(v0.pciAddress, "0000:3b:02.0");
    EXPECT_EQ(v0.driver, "vfio-pci");
    EXPECT_EQ(v0.iommuGroup, "77");
    EXPECT_EQ(v0.userDevices, std::vector<std::string>{"vfio/devices/vfio3"});
    EXPECT_TRUE(v0.interfaces.empty());
    EXPECT_EQ(sriov->vfs[1].number, 2u);
    EXPECT_EQ(sriov->vfs[1].driver, "iavf");
    EXPECT_EQ(sriov->vfs[1].interfaces, std::vector<std::string>{"enp59s2f2"});
    EXPECT_EQ(sriov->vfs[1].userDevices, std::vector<std::string>{"uio1"});
    EXPECT_EQ(sriov->vfs[2].number, 10u);
    EXPECT_EQ(sriov->vfs[2].driver, "");
    EXPECT_EQ(sriov->vfs[2].iommuGroup, "");

    EXPECT_EQ(K::PhysicalPortName(root_, "pf0"), "");
    Write(pf + "/net/pf0/phys_port_name", "p0\n");
    EXPECT_EQ(K::PhysicalPortName(root_, "pf0"), "p0");

    // No SR-IOV capability, one that is no number, an interface without a device, names that
    // are no interfaces.
    Write(pf + "/sriov_totalvfs", "many\n");
    EXPECT_FALSE(K::ReadSriov(root_, "pf0"));
    fs::remove(root_ + "/" + pf + "/sriov_totalvfs");
    EXPECT_FALSE(K::ReadSriov(root_, "pf0"));
    fs::create_directories(root_ + "/devices/virtual/net/veth0");
    Link(root_ + "/devices/virtual/net/veth0", "class/net/veth0");
    for (const char* name : {"veth0", "nowhere", "", "..", "../class/net/pf0"})
        EXPECT_FALSE(K::ReadSriov(root_, name)) << name;
}

TEST_F(SriovTreeTest, FindsTheLowestProcessThatHoldsAFile) {
    auto fd = [&](const std::string& pid, const std::string& number, const std::string& target) {
        Link(target, pid + "/fd/" + number);
        Write(pid + "/comm", "proc" + pid + "\n");
    };
    fd("300", "5", "/dev/vfio/77");
    fd("41", "3", "/dev/vfio/77");
    fd("41", "4", "/dev/uio1");
    fd("52", "9", "socket:[1234]");
    fd("abc", "1", "/dev/vfio/78");  // no process
    auto holders = K::FileHolders({"/dev/vfio/77", "/dev/uio1", "/dev/vfio/78"}, root_);
    ASSERT_EQ(holders.size(), 2u);
    EXPECT_EQ(holders["/dev/vfio/77"].pid, 41u);
    EXPECT_EQ(holders["/dev/vfio/77"].name, "proc41");
    EXPECT_EQ(holders["/dev/uio1"].pid, 41u);
    EXPECT_TRUE(K::FileHolders({}, root_).empty());

    // This process, in the real /proc.
    const std::string file = root_ + "/held";
    Write("held", "");
    const int held = open(file.c_str(), O_RDONLY | O_CLOEXEC);
    ASSERT_GE(held, 0);
    auto real = K::FileHolders({file});
    close(held);
    EXPECT_EQ(real[file].pid, static_cast<std::uint32_t>(getpid()));
}

// ---------------------------------------------------------------- rtnetlink

template <class T>
void Put(nl_msg* message, int type, const T& value) {
    nla_put(message, type, sizeof(value), &value);
}

TEST(VfMessages, ReadsEachVfsSettingsAndCounters) {
    Message message(nlmsg_alloc_simple(RTM_NEWLINK, 0), nlmsg_free);
    ifinfomsg info{};
    info.ifi_index = 7;
    nlmsg_append(message.get(), &info, sizeof(info), NLMSG_ALIGNTO);
    nl_msg* m = message.get();
    nla_put_string(m, IFLA_IFNAME, "pf0");
    const unsigned char pfMac[6] = {0x0a, 0, 0, 0, 0, 1};
    nla_put(m, IFLA_ADDRESS, 6, pfMac);
    nla_put_u32(m, IFLA_NUM_VF, 3);
    nlattr* list = nla_nest_start(m, IFLA_VFINFO_LIST);

    nlattr* vf = nla_nest_start(m, IFLA_VF_INFO);
    Put(m, IFLA_VF_MAC, ifla_vf_mac{0, {0x02, 0xAB, 0, 0, 0, 0x10}});
    Put(m, IFLA_VF_VLAN, ifla_vf_vlan{0, 100, 3});
    nlattr* vlans = nla_nest_start(m, IFLA_VF_VLAN_LIST);
    Put(m, IFLA_VF_VLAN_INFO, ifla_vf_vlan_info{0, 200, 5, htons(0x88a8)});
    nla_nest_end(m, vlans);
    Put(m, IFLA_VF_SPOOFCHK, ifla_vf_spoofchk{0, 1});
    Put(m, IFLA_VF_TRUST, ifla_vf_trust{0, 0});
    Put(m, IFLA_VF_LINK_STATE, ifla_vf_link_state{0, IFLA_VF_LINK_STATE_DISABLE});
    Put(m, IFLA_VF_RATE, ifla_vf_rate{0, 100, 1000});
    Put(m, IFLA_VF_TX_RATE, ifla_vf_tx_rate{0, 999});
    nlattr* stats = nla_nest_start(m, IFLA_VF_STATS);
    nla_put_u64(m, IFLA_VF_STATS_RX_PACKETS, 1000);
    nla_put_u64(m, IFLA_VF_STATS_RX_BYTES, 1ULL << 40);
    nla_put_u64(m, IFLA_VF_STATS_MULTICAST, 30);
    nla_put_u64(m, IFLA_VF_STATS_BROADCAST, 20);
    nla_put_u64(m, IFLA_VF_STATS_TX_DROPPED, 4);
    nla_nest_end(m, stats);
    nla_nest_end(m, vf);

    // A driver that leaves spoof checking and trust unsaid, a kernel without minimum rates.
    vf = nla_nest_start(m, IFLA_VF_INFO);
    Put(m, IFLA_VF_MAC, ifla_vf_mac{1, {}});
    Put(m, IFLA_VF_VLAN, ifla_vf_vlan{1, 0, 0});
    Put(m, IFLA_VF_SPOOFCHK, ifla_vf_spoofchk{1, static_cast<__u32>(-1)});
    Put(m, IFLA_VF_TRUST, ifla_vf_trust{1, static_cast<__u32>(-1)});
    Put(m, IFLA_VF_LINK_STATE, ifla_vf_link_state{1, IFLA_VF_LINK_STATE_ENABLE});
    Put(m, IFLA_VF_TX_RATE, ifla_vf_tx_rate{1, 500});
    nla_nest_end(m, vf);

    // Entries without their number, or with one cut short, are left out.
    vf = nla_nest_start(m, IFLA_VF_INFO);
    Put(m, IFLA_VF_VLAN, ifla_vf_vlan{2, 5, 0});
    nla_nest_end(m, vf);
    vf = nla_nest_start(m, IFLA_VF_INFO);
    nla_put_u32(m, IFLA_VF_MAC, 2);
    nla_nest_end(m, vf);
    nla_nest_end(m, list);

    auto parsed = K::ParseVfs(nlmsg_hdr(m));
    ASSERT_TRUE(parsed);
    EXPECT_EQ(parsed->index, 7);
    EXPECT_EQ(parsed->name, "pf0");
    EXPECT_EQ(parsed->numVfs, 3u);
    EXPECT_TRUE(parsed->reported);
    ASSERT_EQ(parsed->vfs.size(), 2u);
    const auto& v0 = parsed->vfs[0];
    EXPECT_EQ(v0.number, 0u);
    EXPECT_EQ(v0.mac, "02:ab:00:00:00:10");
    ASSERT_EQ(v0.vlans.size(), 1u);  // the list wins over the single VLAN
    EXPECT_EQ(v0.vlans[0].id, 200u);
    EXPECT_EQ(v0.vlans[0].qos, 5u);
    EXPECT_EQ(v0.vlans[0].protocol, 0x88a8);
    EXPECT_EQ(v0.spoofCheck, true);
    EXPECT_EQ(v0.trust, false);
    EXPECT_EQ(v0.linkState, K::VfLinkState::kDisable);
    EXPECT_EQ(v0.minRate, 100u);
    EXPECT_EQ(v0.maxRate, 1000u);
    ASSERT_TRUE(v0.counters);
    EXPECT_EQ(v0.counters->rxPackets, 1000u);
    EXPECT_EQ(v0.counters->rxBytes, 1ULL << 40);
    EXPECT_EQ(v0.counters->txDropped, 4u);
    EXPECT_EQ(v0.counters->txPackets, 0u);
    const auto& v1 = parsed->vfs[1];
    EXPECT_EQ(v1.mac, "00:00:00:00:00:00");
    EXPECT_TRUE(v1.vlans.empty());
    EXPECT_FALSE(v1.spoofCheck);
    EXPECT_FALSE(v1.trust);
    EXPECT_EQ(v1.linkState, K::VfLinkState::kEnable);
    EXPECT_EQ(v1.maxRate, 500u);
    EXPECT_FALSE(v1.counters);
}

TEST(VfMessages, LinksWithoutVfsRequestsAndOtherMessages) {
    Message link(nlmsg_alloc_simple(RTM_NEWLINK, 0), nlmsg_free);
    ifinfomsg info{};
    nlmsg_append(link.get(), &info, sizeof(info), NLMSG_ALIGNTO);
    nla_put_string(link.get(), IFLA_IFNAME, "veth0");
    auto parsed = K::ParseVfs(nlmsg_hdr(link.get()));
    ASSERT_TRUE(parsed);
    EXPECT_FALSE(parsed->numVfs);
    EXPECT_FALSE(parsed->reported);
    Message other(nlmsg_alloc_simple(RTM_NEWADDR, 0), nlmsg_free);
    EXPECT_FALSE(K::ParseVfs(nlmsg_hdr(other.get())));

    for (bool counters : {true, false}) {
        Message request(K::BuildVfRequest(12, counters), nlmsg_free);
        nlmsghdr* header = nlmsg_hdr(request.get());
        EXPECT_EQ(header->nlmsg_type, RTM_GETLINK);
        EXPECT_EQ(header->nlmsg_flags, NLM_F_REQUEST);  // one link, not a dump
        EXPECT_EQ(static_cast<ifinfomsg*>(nlmsg_data(header))->ifi_index, 12);
        nlattr* tb[IFLA_MAX + 1] = {};
        ASSERT_EQ(nlmsg_parse(header, sizeof(ifinfomsg), tb, IFLA_MAX, nullptr), 0);
        ASSERT_TRUE(tb[IFLA_EXT_MASK]);
        EXPECT_EQ(nla_get_u32(tb[IFLA_EXT_MASK]),
                  counters ? RTEXT_FILTER_VF : RTEXT_FILTER_VF | RTEXT_FILTER_SKIP_STATS);
    }
}

// ---------------------------------------------------------------- the area's decisions

TEST(VfUse, RepresentorsOfFunctionsAreNoPhysicalFunctions) {
    for (const char* name : {"pf0vf3", "c1pf0vf12", "pf1sf2", "p0pf0vf0"})
        EXPECT_TRUE(L::IsFunctionRepresentor(name)) << name;
    for (const char* name : {"", "p0", "p0s1", "pf0", "c1pf0", "pfvf1", "pf0vf", "pf0vfx", "eth"})
        EXPECT_FALSE(L::IsFunctionRepresentor(name)) << name;
}

TEST(VfUse, WhoHoldsAVfAndWhetherItIsInUse) {
    K::VirtualFunction vfio;
    vfio.driver = "vfio-pci";
    vfio.iommuGroup = "77";
    vfio.userDevices = {"vfio/devices/vfio3"};
    EXPECT_EQ(L::VfDeviceFiles(vfio),
              (std::vector<std::string>{"/dev/vfio/77", "/dev/vfio/noiommu-77", "/dev/vfio/devices/vfio3"}));
    K::VirtualFunction host;
    host.driver = "iavf";
    host.iommuGroup = "78";  // a group that is no device file without a VFIO driver
    host.interfaces = {"vf1", "vf1b"};
    EXPECT_TRUE(L::VfDeviceFiles(host).empty());

    const std::map<std::string, K::Process> none;
    const std::map<std::string, K::Process> held{{"/dev/vfio/devices/vfio3", {900, "qemu"}},
                                                 {"/dev/vfio/77", {812, "qemu"}}};
    auto use = [](const K::VirtualFunction& vf, std::optional<K::VfLinkState> state,
                  const std::map<std::string, K::Process>& holders, const std::map<std::string, bool>& up) {
        auto u = L::DecideVfUse(vf, state, holders, up);
        return std::to_string(u.active) + "/" + u.owner;
    };
    // Held by processes: the lowest PID owns it, in use unless the PF holds its link down.
    EXPECT_EQ(use(vfio, std::nullopt, held, {}), "1/812");
    EXPECT_EQ(use(vfio, K::VfLinkState::kDisable, held, {}), "0/812");
    // A user-space driver no process holds, a VF without a driver.
    EXPECT_EQ(use(vfio, K::VfLinkState::kEnable, none, {}), "0/");
    K::VirtualFunction stub;
    stub.driver = "pci-stub";
    EXPECT_EQ(use(stub, std::nullopt, none, {}), "0/");
    EXPECT_EQ(use(K::VirtualFunction(), std::nullopt, held, {}), "0/");
    // A kernel driver: in use while one of its interfaces here is up, or when none is here.
    EXPECT_EQ(use(host, std::nullopt, none, {{"vf1", false}, {"vf1b", true}}), "1/");
    EXPECT_EQ(use(host, std::nullopt, none, {{"vf1", false}}), "0/");
    EXPECT_EQ(use(host, K::VfLinkState::kAuto, none, {{"other", false}}), "1/");
    EXPECT_EQ(use(host, K::VfLinkState::kDisable, none, {{"vf1", true}}), "0/");
}

TEST(VfUse, CountersAsTheLibrarysRecord) {
    K::VfCounters c;
    c.rxPackets = 100;
    c.multicast = 30;
    c.broadcast = 20;
    c.rxBytes = 6400;
    c.txPackets = 7;
    c.txBytes = 700;
    c.rxDropped = 2;
    c.txDropped = 1;
    auto s = L::VfStatsOf(c);
    EXPECT_EQ(s.rxUnicastPkts, 50u);
    EXPECT_EQ(s.rxMulticastPkts, 30u);
    EXPECT_EQ(s.rxBroadcastPkts, 20u);
    EXPECT_EQ(s.rxUnicastBytes, 6400u);
    EXPECT_EQ(s.rxMulticastBytes, 0u);
    EXPECT_EQ(s.txUnicastPkts, 7u);
    EXPECT_EQ(s.txUnicastBytes, 700u);
    EXPECT_EQ(s.rxOutOfBufferDrops, 2u);
    EXPECT_EQ(s.txDiscards, 1u);
    // A driver whose multicast and broadcast exceed what it received (counters read at
    // different moments) gives no unicast frames rather than a wrapped number.
    c.rxPackets = 40;
    EXPECT_EQ(L::VfStatsOf(c).rxUnicastPkts, 0u);
}

}  // namespace

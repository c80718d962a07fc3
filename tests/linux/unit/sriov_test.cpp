// SR-IOV below the kernel: a physical function's VFs in a sysfs tree of the test's own, links
// with VF information built in memory, the holders of device files in a /proc tree of the
// test's own, and what the NIC area makes of them (which VF is in use, and by whom; counters).
#include <arpa/inet.h>
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

// A VF as one line: number, PCI function, driver, IOMMU group, interfaces, device files.
std::string Line(const K::VirtualFunction& vf) {
    std::string line =
        std::to_string(vf.number) + " " + vf.pciAddress + " " + vf.driver + " " + vf.iommuGroup;
    for (const auto& name : vf.interfaces)
        line += " if:" + name;
    for (const auto& name : vf.userDevices)
        line += " dev:" + name;
    return line;
}

TEST_F(SriovTreeTest, ReadsThePhysicalFunctionAndItsVirtualFunctions) {
    const std::string pf = "devices/pci0000:3a/0000:3b:00.0";
    fs::create_directories(root_ + "/" + pf + "/net/pf0");
    Link(root_ + "/" + pf, pf + "/net/pf0/device");
    Link(root_ + "/" + pf + "/net/pf0", "class/net/pf0");
    Write(pf + "/sriov_totalvfs", "64\n");
    Write(pf + "/sriov_numvfs", "12\n");
    auto vf = [&](int number, const std::string& address, const std::string& driver) {
        const std::string dir = "devices/pci0000:3a/" + address;
        fs::create_directories(root_ + "/" + dir);
        Link(root_ + "/" + dir, pf + "/virtfn" + std::to_string(number));
        if (!driver.empty()) Link("../../../bus/pci/drivers/" + driver, dir + "/driver");
        return root_ + "/" + dir;
    };
    // VF 0 handed to VFIO, VF 2 driven by the kernel, VF 10 without a driver (after VF 2: by
    // number, not by name), and links that are no VFs.
    Link("../../../kernel/iommu_groups/77", "devices/pci0000:3a/0000:3b:02.0/iommu_group");
    fs::create_directories(vf(0, "0000:3b:02.0", "vfio-pci") + "/vfio-dev/vfio3");
    const std::string kernel = vf(2, "0000:3b:02.2", "iavf");
    fs::create_directories(kernel + "/net/enp59s2f2");
    fs::create_directories(kernel + "/uio/uio1");
    vf(10, "0000:3b:03.2", "");
    Link(root_ + "/devices/pci0000:3a/0000:3b:09.0", pf + "/virtfn11");  // leads nowhere
    Link(root_ + "/devices/pci0000:3a/0000:3b:02.0", pf + "/virtfnx");

    auto sriov = K::ReadSriov(root_, "pf0");
    ASSERT_TRUE(sriov);
    EXPECT_EQ(sriov->totalVfs, 64u);
    EXPECT_EQ(sriov->numVfs, 12u);
    std::vector<std::string> lines;
    for (const auto& each : sriov->vfs)
        lines.push_back(Line(each));
    EXPECT_EQ(lines,
              (std::vector<std::string>{"0 0000:3b:02.0 vfio-pci 77 dev:vfio/devices/vfio3",
                                        "2 0000:3b:02.2 iavf  if:enp59s2f2 dev:uio1", "10 0000:3b:03.2  "}));
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
}

// ---------------------------------------------------------------- rtnetlink

std::string Line(const K::VfConfig& vf) {
    char vlan[64];
    std::string line = std::to_string(vf.number) + " " + vf.mac;
    for (const auto& each : vf.vlans) {
        snprintf(vlan, sizeof(vlan), " vlan:%u/%u/%x", each.id, each.qos, each.protocol);
        line += vlan;
    }
    auto setting = [](std::optional<bool> value) {
        return value ? std::to_string(*value) : std::string("-");
    };
    line += " spoof:" + setting(vf.spoofCheck) + " trust:" + setting(vf.trust) +
            " state:" + std::to_string(static_cast<int>(vf.linkState)) +
            " rate:" + std::to_string(vf.minRate) + "-" + std::to_string(vf.maxRate);
    if (const auto& c = vf.counters) {
        const char* separator = " counters:";
        for (auto n : {c->rxPackets, c->txPackets, c->rxBytes, c->txBytes, c->broadcast, c->multicast,
                       c->rxDropped, c->txDropped}) {
            line += separator + std::to_string(n);
            separator = ",";
        }
    }
    return line;
}

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
    std::vector<std::string> lines;
    for (const auto& each : parsed->vfs)
        lines.push_back(Line(each));
    // The VLAN list wins over the single VLAN; -1 is a setting left unsaid.
    EXPECT_EQ(lines, (std::vector<std::string>{
                         "0 02:ab:00:00:00:10 vlan:200/5/88a8 spoof:1 trust:0 state:2 rate:100-1000 "
                         "counters:1000,0,1099511627776,0,20,30,0,4",
                         "1 00:00:00:00:00:00 spoof:- trust:- state:1 rate:0-500"}));
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
    const std::map<std::string, K::Process> held{{"/dev/vfio/devices/vfio3", {900, "vm"}},
                                                 {"/dev/vfio/77", {812, "vm"}}};
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
    // rx, tx packets and bytes, broadcast, multicast, rx and tx drops.
    K::VfCounters c{100, 7, 6400, 700, 20, 30, 2, 1};
    auto s = L::VfStatsOf(c);
    EXPECT_EQ((std::vector<std::uint64_t>{s.rxUnicastPkts, s.rxMulticastPkts, s.rxBroadcastPkts,
                                          s.rxUnicastBytes, s.rxMulticastBytes, s.txUnicastPkts,
                                          s.txUnicastBytes, s.rxOutOfBufferDrops, s.txDiscards}),
              (std::vector<std::uint64_t>{50, 30, 20, 6400, 0, 7, 700, 2, 1}));
    // Multicast and broadcast above what was received (counters read at different moments)
    // give no unicast frames rather than a wrapped number.
    c.rxPackets = 40;
    EXPECT_EQ(L::VfStatsOf(c).rxUnicastPkts, 0u);
}

}  // namespace

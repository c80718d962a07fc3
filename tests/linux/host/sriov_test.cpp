// SR-IOV NICs of the Linux host. This machine has no SR-IOV device: a plain host gives the
// none results and refusals; then a veth is made to look like a physical function by a tmpfs
// over its sysfs directory that holds a PCI device tree with VFs (one handed to VFIO and held
// by a process, one driven by a kernel driver through an interface of the test's, one without
// a driver), so that hadrocli reads it as it would a real one while rtnetlink answers for the
// veth (which reports no VFs). The area is also run in-process against a sysfs tree of its own.
#include <signal.h>
#include <sys/mount.h>

#include <filesystem>

#include "core/context.h"
#include "hostctl/exception.h"
#include "namespace_host.h"
#include "network/pnic.h"

namespace {

using nlohmann::json;

class SriovTest : public Hadro::Test::NamespaceHostTest {
protected:
    void SetUp() override {
        NamespaceHostTest::SetUp();
        if (IsSkipped()) return;
        Configure("nics = vmnic?\n");
        Sh("ip link add vmnic0 type veth peer name peer0 && ip link add pf0 type veth peer name peer1 && "
           "ip link set pf0 up && ip link set peer1 up");
    }
    void TearDown() override {
        if (holder_) kill(holder_, SIGKILL);
        if (devices_) umount2("/dev", MNT_DETACH);
        NamespaceHostTest::TearDown();
    }

    // The error line of a command that must fail with exit status 1 (never 3).
    std::string Refused(const std::string& arguments) {
        auto result = Hadro(arguments);
        EXPECT_EQ(result.status, 1) << arguments << "\n" << result.All();
        return result.err;
    }

    // Gives interface NAME a PCI device (abcd:ef01 at 0000:3b:00.0) with the SR-IOV capability.
    std::string FakeFunction(const std::string& name, const std::string& total, const std::string& enabled) {
        const std::string dir = "/sys/devices/virtual/net/" + name, pci = dir + "/pci/0000:3b:00.0";
        Sh("mount -t tmpfs tmpfs " + dir + " && mkdir -p " + dir + "/bus/pci " + pci + " && ln -s " + dir +
           "/bus/pci " + pci + "/subsystem && ln -s " + pci + " " + dir + "/device && echo 0xabcd >" + pci +
           "/vendor && echo 0xef01 >" + pci + "/device && echo " + total + " >" + pci +
           "/sriov_totalvfs && echo " + enabled + " >" + pci + "/sriov_numvfs");
        return pci;
    }
    // A VF of that function, with the driver given (none when empty).
    std::string FakeVf(const std::string& pci, int number, const std::string& address,
                       const std::string& driver) {
        const std::string vf = pci + "/../" + address;
        Sh("mkdir -p " + vf + " && ln -s " + vf + " " + pci + "/virtfn" + std::to_string(number));
        if (!driver.empty()) Sh("ln -s " + pci + "/../../bus/pci/drivers/" + driver + " " + vf + "/driver");
        return vf;
    }

    pid_t holder_ = 0;
    bool devices_ = false;
};

TEST_F(SriovTest, APlainHostHasNoSriovNic) {
    EXPECT_EQ(HadroJson("network sriovnic list"), json::array());
    EXPECT_EQ(HadroUnprivileged("--formatter=json network sriovnic list").out, "[]\n");
    for (const char* name : {"vmnic0", "pf0", "nowhere"}) {
        const std::string expected = "There is no SRIOV Nic with name " + std::string(name) + "\n";
        EXPECT_EQ(Refused("network sriovnic vf list -n " + std::string(name)), expected);
        EXPECT_EQ(Refused("network sriovnic vf stats -n " + std::string(name) + " -v 0"), expected);
    }
    // A device whose driver allows no VF is no SR-IOV NIC; one with SR-IOV enabled but no VF
    // has an empty list.
    const std::string pci = FakeFunction("vmnic0", "0", "0");
    EXPECT_EQ(HadroJson("network sriovnic list"), json::array());
    Sh("echo 8 >" + pci + "/sriov_totalvfs");
    EXPECT_EQ(HadroJson("network sriovnic list").size(), 1u);
    EXPECT_EQ(HadroJson("network sriovnic vf list -n vmnic0"), json::array());
    EXPECT_EQ(Refused("network sriovnic vf stats -n vmnic0 -v 0"),
              "Unable to get VF Stats. Error:vmnic0 has no VF 0\n");
}

TEST_F(SriovTest, VirtualFunctionsTheirUseAndCounters) {
    const std::string pci = FakeFunction("pf0", "64", "3");
    // VF 0 handed to VFIO and held by a process, as a virtual machine's emulator holds it.
    const std::string vfio = FakeVf(pci, 0, "0000:3b:02.0", "vfio-pci");
    Sh("ln -s /sys/kernel/iommu_groups/77 " + vfio + "/iommu_group");
    Sh("mkdir -p " + dir_ + "/dev-upper " + dir_ +
       "/dev-work && mount -t overlay overlay -o lowerdir=/dev,upperdir=" + dir_ +
       "/dev-upper,workdir=" + dir_ + "/dev-work /dev");
    devices_ = true;
    Sh("mkdir /dev/vfio && : >/dev/vfio/77");
    holder_ = std::stoi(Sh("sleep 600 3</dev/vfio/77 >/dev/null 2>&1 & echo $!"));
    // VF 1 driven by the kernel through interface vf1, VF 2 without a driver, VF 300 beyond
    // what the library can name.
    Sh("ip link add vf1 type veth peer name vf1p && mkdir -p " + FakeVf(pci, 1, "0000:3b:02.1", "iavf") +
       "/net/vf1");
    FakeVf(pci, 2, "0000:3b:02.2", "");
    FakeVf(pci, 300, "0000:3b:27.4", "iavf");

    auto list = HadroJson("network sriovnic list");
    const auto link = ShJson("ip -j link show pf0")[0];
    ASSERT_EQ(list.size(), 1u) << list.dump();  // vmnic0 has no SR-IOV device
    EXPECT_EQ(list[0]["Name"], "pf0");
    EXPECT_EQ(list[0]["PCI Device"], "0000:3b:00.0");
    EXPECT_EQ(list[0]["Driver"], "veth");
    EXPECT_EQ(list[0]["Link"], "Up");
    EXPECT_EQ(list[0]["MAC Address"], link["address"]);
    EXPECT_EQ(list[0]["MTU"], link["mtu"]);
    EXPECT_EQ(list[0]["Description"], "Vendor abcd Device ef01");

    auto vfs = Hadro("--formatter=json network sriovnic vf list -n pf0");
    EXPECT_EQ(vfs.status, 0) << vfs.All();
    EXPECT_EQ(json::parse(vfs.out), json::parse(R"([
        {"VF ID":0,"Active":true,"PCI Address":"0000:3b:02.0","Owner World ID":")" +
                                                std::to_string(holder_) + R"("},
        {"VF ID":1,"Active":false,"PCI Address":"0000:3b:02.1","Owner World ID":""},
        {"VF ID":2,"Active":false,"PCI Address":"0000:3b:02.2","Owner World ID":""}])"));
    EXPECT_EQ(vfs.err, "Warning: VF 300 of pf0 is left out: VF IDs above 255 cannot be shown\n");

    // Another user cannot see who holds VF 0, and is told so.
    auto unprivileged = HadroUnprivileged("--formatter=json network sriovnic vf list -n pf0");
    EXPECT_EQ(unprivileged.status, 0) << unprivileged.All();
    EXPECT_EQ(json::parse(unprivileged.out)[0]["Owner World ID"], "");
    EXPECT_NE(
        unprivileged.err.find("Warning: a VF handed to a process of another user is shown as not in use: "
                              "seeing who holds a VF needs root\n"),
        std::string::npos)
        << unprivileged.err;

    // VF 1 is in use while its interface is up; VF 0 once its holder is gone is not.
    Sh("ip link set vf1 up");
    kill(holder_, SIGKILL);
    holder_ = 0;
    Sh("sleep 0.2");
    vfs = Hadro("--formatter=json network sriovnic vf list -n pf0");
    EXPECT_EQ(json::parse(vfs.out)[0]["Active"], false);
    EXPECT_EQ(json::parse(vfs.out)[0]["Owner World ID"], "");
    EXPECT_EQ(json::parse(vfs.out)[1]["Active"], true);

    // The veth driver reports no VFs through rtnetlink: no counters.
    EXPECT_EQ(Refused("network sriovnic vf stats -n pf0 -v 1"),
              "Unable to get VF Stats. Error:The driver of pf0 (veth) reports no counters of VF 1\n");
    EXPECT_EQ(Refused("network sriovnic vf stats -n pf0 -v 3"),
              "Unable to get VF Stats. Error:pf0 has no VF 3\n");
}

TEST_F(SriovTest, TheAreaRefusesWhatIsNoSriovNic) {
    // A sysfs tree of the area's own: vmnic0 has an SR-IOV device, pf0 a device without.
    const std::string root = dir_ + "/sys";
    for (const std::string name : {"vmnic0", "pf0"}) {
        std::filesystem::create_directories(root + "/devices/" + name);
        std::filesystem::create_directories(root + "/class/net/" + name);
        std::filesystem::create_symlink(root + "/devices/" + name, root + "/class/net/" + name + "/device");
    }
    Sh("echo 4 >" + root + "/devices/vmnic0/sriov_totalvfs");
    TknCtl::Linux::Context context(TknCtl::Linux::Config::Load());
    TknCtl::Linux::LinuxNics nics(context, root);
    EXPECT_TRUE(nics.IsSriovNic("vmnic0"));
    EXPECT_FALSE(nics.IsSriovNic("pf0"));
    auto refusal = [&](const std::function<void()>& call) {
        try {
            call();
        } catch (const HostCtl::Lib::HostCtlException& e) {
            return e.GetMessage();
        }
        return std::string("(none)");
    };
    HostCtl::Network::SriovNicVFStats stats;
    EXPECT_EQ(refusal([&] { nics.GetSriovNicVFInfo("pf0"); }), "pf0 is not an SR-IOV enabled NIC");
    EXPECT_EQ(refusal([&] { nics.GetSriovNicVFStats("pf0", 0, stats); }), "pf0 is not an SR-IOV enabled NIC");
    EXPECT_EQ(refusal([&] { nics.GetSriovNicVFInfo("nowhere"); }), "Physical NIC nowhere does not exist");
    EXPECT_EQ(refusal([&] { nics.GetSriovNicVFStats("vmnic0", 255, stats); }), "vmnic0 has no VF 255");
}

}  // namespace

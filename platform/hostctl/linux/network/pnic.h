// The physical NICs of the Linux host: the interfaces of the program's own namespace that are
// backed by a device in sysfs, and those the configuration's "nics =" line names. Everything
// is read from the kernel at each call: links through rtnetlink (kernel/links.h), settings
// through ethtool (kernel/ethtool.h: netlink, and the ioctl where netlink lacks the request),
// the hardware behind an interface from sysfs (kernel/sysfs.h).
//
// The area's methods are defined in the files named as their twins on the simulated host:
// network/pnic.cpp (identity, link, general settings), pnic_tunables.cpp, pnic_diag.cpp,
// pnic_netqueue.cpp, sriov.cpp and vlan_stats.cpp.
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "backend/nics.h"
#include "core/context.h"
#include "kernel/ethtool.h"
#include "kernel/links.h"
#include "kernel/sysfs.h"

namespace TknCtl::Linux {

// Whether the interface of that name counts as a physical NIC: it is backed by a device in sysfs
// (under the sysfs root given) or the configuration's "nics" line names it. The one test every
// area uses (the NICs, the switches' uplinks).
bool IsPhysicalNic(const Config& config, const std::string& sysfs, const std::string& name);

class LinuxNics final : public Backend::Nics {
public:
    // sysfs: the root of sysfs (tests give a tree of their own).
    explicit LinuxNics(Context& context, std::string sysfs = "/sys");

    std::vector<std::string> List() override;
    bool Has(const std::string& name) override;
    std::unique_ptr<HostCtl::Network::PciDevice> GetPciDevice(const std::string& name) override;
    std::string GetDeviceDescription(const std::string& name) override;
    void GetDriverInfo(const std::string& name, HostCtl::Network::PnicDriverInfo& info) override;
    Backend::NicLink GetLink(const std::string& name) override;
    void SetAdminUp(const std::string& name, bool up) override;
    void GetPnicInfo(const std::string& name, HostCtl::Network::PnicInfo& info) override;
    void SetPnicInfo(const std::string& name, const HostCtl::Network::PnicInfo& info) override;
    void SetSpeedDuplex(const std::string& name, std::uint32_t speed, std::uint32_t duplex) override;

    void GetPauseParams(const std::string& name, HostCtl::Network::PnicPauseParams& pause) override;
    void SetPauseParams(const std::string& name, const HostCtl::Network::PnicPauseParams& pause) override;
    void GetCoalesceParams(const std::string& name, HostCtl::Network::PnicCoalesceParams& params) override;
    void SetCoalesceParams(const std::string& name,
                           const HostCtl::Network::PnicCoalesceParams& params) override;
    void GetOffloadSettings(const std::string& name,
                            HostCtl::Network::PnicOffloadSettings& settings) override;
    void SetOffloadSettings(const std::string& name,
                            const HostCtl::Network::PnicOffloadSettings& settings) override;
    void GetRingParams(const std::string& name, HostCtl::Network::PnicRingParams& params) override;
    void SetRingParams(const std::string& name, const HostCtl::Network::PnicRingParams& params) override;
    void GetSoftwareSettings(const std::string& name,
                             HostCtl::Network::PnicSoftwareSettings& settings) override;
    void SetSoftwareSettings(const std::string& name,
                             const HostCtl::Network::PnicSoftwareSettings& settings) override;

    void GetStats(const std::string& name, HostCtl::Network::PnicStats& stats) override;
    void GetRegisterDump(const std::string& name, std::vector<std::uint8_t>& bytes) override;
    void GetEepromDump(const std::string& name, std::vector<std::uint8_t>& bytes, std::int64_t length,
                       std::int64_t offset) override;
    std::uint32_t BeginEepromWrite(const std::string& name, std::int64_t magic) override;
    void WriteEeprom(const std::string& name, std::int64_t magic, std::int64_t offset,
                     const std::vector<std::uint8_t>& bytes) override;
    void RunSelfTest(const std::string& name, HostCtl::Network::PnicSelfTestResult& result,
                     bool online) override;
    void RestartNegotiation(const std::string& name) override;

    void GetNetqueueInfo(const std::string& name, HostCtl::Network::PnicNetqueueInfo& info) override;
    void SetNetqueueInfo(const std::string& name, const HostCtl::Network::PnicNetqueueInfo& info) override;

    std::vector<std::string> ListSriovNics() override;
    bool IsSriovNic(const std::string& name) override;
    std::vector<HostCtl::Network::SriovNicVFInfo> GetSriovNicVFInfo(const std::string& name) override;
    void GetSriovNicVFStats(const std::string& name, std::uint8_t vfId,
                            HostCtl::Network::SriovNicVFStats& stats) override;

    std::vector<HostCtl::Network::VlanStats> GetUplinkVlanStats(const std::string& switchName,
                                                                const std::string& uplink) override;
    void SetUplinkVlanStatsEnabled(const std::string& switchName, const std::string& uplink,
                                   bool enabled) override;

private:
    // The namespace of the physical NICs: the program's own (defaultTcpipStack).
    Kernel::Namespace Own() const { return Kernel::Namespace::Own(); }
    bool IsNic(const Kernel::Link& link) const;
    // The link of a physical NIC; throws HostCtlException("Physical NIC NAME does not exist")
    // for a name the host has no NIC of.
    Kernel::Link Require(const std::string& name);
    Kernel::Ethtool& Ethtool();
    // A GET of the ethtool family; what names the request for the message of a refusal
    // ("Cannot read WHAT of NAME: REFUSAL").
    Kernel::EthtoolReply Get(std::uint8_t command, const std::string& name, const std::string& what);
    // The same, with nothing when the driver has no such operation.
    std::optional<Kernel::EthtoolReply> GetIfSupported(std::uint8_t command, const std::string& name,
                                                       const std::string& what);
    // Sends a change ("Cannot change WHAT of NAME: REFUSAL" when refused).
    void Change(nl_msg* request, const std::string& name, const std::string& what);
    // The driver's name, for messages ("the driver (veth)").
    std::string DriverOf(const std::string& name);
    // The features of the NIC (ETHTOOL_MSG_FEATURES_GET).
    Kernel::EthtoolReply Features(const std::string& name);
    // Sets named features and reads them back: each must end up as asked, else the change of
    // what is refused, naming the features the kernel kept.
    void ChangeFeatures(const std::string& name, const std::vector<std::pair<std::string, bool>>& wanted,
                        const std::string& what);

    Context& context_;
    std::string sysfs_;
    std::unique_ptr<Kernel::Ethtool> ethtool_;
};

// A refusal of the kernel or the driver after what was asked: "WHAT: REFUSAL".
[[noreturn]] void Refuse(const std::string& what, const Kernel::EthtoolRefusal& refusal);

// A link mode as the kernel names it ("1000baseT/Full", "100000baseLR4_ER4/Full") as the
// library's (speed, duplex, media code); nothing for a name that is no speed mode ("Autoneg",
// "TP", "Pause", FEC modes).
std::optional<HostCtl::Network::PnicLinkMode> ParseLinkModeName(const std::string& name);

// The PCI function of a NIC's device with the names of its vendor and model (from the PCI ID
// database; empty when it lacks them, and then the IDs stand in); nothing for a device on no
// PCI function.
std::unique_ptr<HostCtl::Network::PciDevice> PciDeviceOf(const Kernel::NetDevice& device,
                                                         const std::pair<std::string, std::string>& names);
// What a NIC that is no PCI function says it is: "USB-NIC:<vendor>:<device>" for a USB adapter,
// else its bus and name; an interface without a device is a virtual device of its kind.
std::string DeviceDescription(const std::optional<Kernel::NetDevice>& device, const std::string& kind);

// What pause auto-negotiation agrees on from the abilities both ends advertise (IEEE 802.3
// annex 28B): whether the NIC honours pause frames it receives, and whether it sends them.
std::pair<bool, bool> ResolvePause(bool ourPause, bool ourAsymmetric, bool peerPause, bool peerAsymmetric);

}  // namespace TknCtl::Linux

// Physical NICs of a real host.
//
// The adapter operations (TknCtl::Network::PnicImpl, NetworkInfoImpl::GetPnics and
// GetPnicByName, the SR-IOV operations, the VLAN counters of switch uplinks) hand their work
// to this area when the session manages a real host:
//
//     void PnicImpl::GetRingParams(Net::PnicRingParams& params) const {
//         if (auto* nics = Backend::EnterRealNics("HostCtl::Network::Pnic::GetRingParams", name_))
//             return nics->GetRingParams(name_, params);
//         ... the simulated host ...
//     }
//
// Every method names its NIC; one the host does not have (or an interface that is no physical
// NIC) is refused with HostCtlException("Physical NIC NAME does not exist"), as on the
// simulated host. Reads fill the library's records with what the host says now; a change is
// carried out and read back, or refused with a HostCtlException that says why (for a request
// the driver refuses: the driver's own refusal).
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "backend/host.h"
#include "core/hook.h"
#include "hostctl/network/nic.h"
#include "hostctl/network/portset.h"

namespace TknCtl::Backend {

// The link of a NIC as the host sees it at one moment.
struct NicLink {
    bool adminUp = false;       // administratively up
    bool linkUp = false;        // carrier detected
    bool linkStatusUp = false;  // operational: up and carrying traffic
    std::uint32_t speed = 0;    // Mbps; 0 without link or when the driver does not say
    std::uint32_t duplex = HostCtl::Network::PNIC_DUPLEX_HALF;  // FULL or HALF
    std::string mac;
    std::uint32_t mtu = 0;
};

class Nics {
public:
    virtual ~Nics();

    // The names of the physical NICs, in the host's order.
    virtual std::vector<std::string> List() = 0;
    // Whether the host has a physical NIC of that name (never throws for a name it lacks).
    virtual bool Has(const std::string& name) = 0;

    // Identity: the PCI function (nothing for a pseudo adapter), what a pseudo adapter says it
    // is, the driver.
    virtual std::unique_ptr<HostCtl::Network::PciDevice> GetPciDevice(const std::string& name) = 0;
    virtual std::string GetDeviceDescription(const std::string& name) = 0;
    virtual void GetDriverInfo(const std::string& name, HostCtl::Network::PnicDriverInfo& info) = 0;

    // Link and general settings.
    virtual NicLink GetLink(const std::string& name) = 0;
    virtual void SetAdminUp(const std::string& name, bool up) = 0;
    virtual void GetPnicInfo(const std::string& name, HostCtl::Network::PnicInfo& info) = 0;
    virtual void SetPnicInfo(const std::string& name, const HostCtl::Network::PnicInfo& info) = 0;
    virtual void SetSpeedDuplex(const std::string& name, std::uint32_t speed, std::uint32_t duplex) = 0;

    // Tunables.
    virtual void GetPauseParams(const std::string& name, HostCtl::Network::PnicPauseParams& pause) = 0;
    virtual void SetPauseParams(const std::string& name, const HostCtl::Network::PnicPauseParams& pause) = 0;
    virtual void GetCoalesceParams(const std::string& name, HostCtl::Network::PnicCoalesceParams& params) = 0;
    virtual void SetCoalesceParams(const std::string& name,
                                   const HostCtl::Network::PnicCoalesceParams& params) = 0;
    virtual void GetOffloadSettings(const std::string& name,
                                    HostCtl::Network::PnicOffloadSettings& settings) = 0;
    virtual void SetOffloadSettings(const std::string& name,
                                    const HostCtl::Network::PnicOffloadSettings& settings) = 0;
    virtual void GetRingParams(const std::string& name, HostCtl::Network::PnicRingParams& params) = 0;
    virtual void SetRingParams(const std::string& name, const HostCtl::Network::PnicRingParams& params) = 0;
    virtual void GetSoftwareSettings(const std::string& name,
                                     HostCtl::Network::PnicSoftwareSettings& settings) = 0;
    virtual void SetSoftwareSettings(const std::string& name,
                                     const HostCtl::Network::PnicSoftwareSettings& settings) = 0;

    // Counters and diagnostics.
    virtual void GetStats(const std::string& name, HostCtl::Network::PnicStats& stats) = 0;
    virtual void GetRegisterDump(const std::string& name, std::vector<std::uint8_t>& bytes) = 0;
    // EEPROM bytes from offset on: length of them (0: to the end), cut at the end of the
    // EEPROM; an offset outside it or a negative length is refused.
    virtual void GetEepromDump(const std::string& name, std::vector<std::uint8_t>& bytes, std::int64_t length,
                               std::int64_t offset) = 0;
    // Before an EEPROM write: checks that the change may be made (the magic key's range,
    // privilege, an EEPROM the driver writes) and gives the EEPROM's size in bytes.
    virtual std::uint32_t BeginEepromWrite(const std::string& name, std::int64_t magic) = 0;
    // Writes bytes from offset on (within the EEPROM); magic is the driver's key.
    virtual void WriteEeprom(const std::string& name, std::int64_t magic, std::int64_t offset,
                             const std::vector<std::uint8_t>& bytes) = 0;
    virtual void RunSelfTest(const std::string& name, HostCtl::Network::PnicSelfTestResult& result,
                             bool online) = 0;
    virtual void RestartNegotiation(const std::string& name) = 0;

    // Netqueue.
    virtual void GetNetqueueInfo(const std::string& name, HostCtl::Network::PnicNetqueueInfo& info) = 0;
    virtual void SetNetqueueInfo(const std::string& name, const HostCtl::Network::PnicNetqueueInfo& info) = 0;

    // SR-IOV: the NICs that are SR-IOV physical functions, in the host's order; whether a NIC is
    // one (never throws for a name the host lacks); the virtual functions of one, by VF ID; the
    // counters of one VF. A NIC that is no SR-IOV physical function is refused with
    // HostCtlException("NAME is not an SR-IOV enabled NIC"), a VF it lacks with
    // HostCtlException("NAME has no VF ID").
    virtual std::vector<std::string> ListSriovNics() = 0;
    virtual bool IsSriovNic(const std::string& name) = 0;
    virtual std::vector<HostCtl::Network::SriovNicVFInfo> GetSriovNicVFInfo(const std::string& name) = 0;
    virtual void GetSriovNicVFStats(const std::string& name, std::uint8_t vfId,
                                    HostCtl::Network::SriovNicVFStats& stats) = 0;

    // Per-VLAN counters of a switch's uplink; empty while their collection is off. Refused when
    // the switch has no such uplink.
    virtual std::vector<HostCtl::Network::VlanStats> GetUplinkVlanStats(const std::string& switchName,
                                                                        const std::string& uplink) = 0;
    virtual void SetUplinkVlanStatsEnabled(const std::string& switchName, const std::string& uplink,
                                           bool enabled) = 0;
};

// The NICs of the real host the session manages, once the operation has entered (journal and
// faults: Lib::Enter); nullptr on the simulated host, where the operation enters itself.
inline Nics* EnterRealNics(std::string_view operation, std::string_view target = {}) {
    Host* host = Lib::RealHost();
    if (!host) return nullptr;
    Lib::Enter(operation, target);
    return &host->GetNics();
}

}  // namespace TknCtl::Backend

// Physical NICs (adapters): their general settings, link, pause, coalescing, offloads, rings,
// the software simulation of offload features, counters, diagnostics, netqueue, and the virtual
// functions of SR-IOV adapters.
//
// An adapter object holds only the adapter's name and reads the host at each call; an
// operation on an adapter that no longer exists throws HostCtlException. Records are filled
// by the Get... operations and applied by the Set... operations; a Set... operation checks
// the whole request against what the adapter supports before it changes anything.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "hostctl/lib/object.h"
#include "hostctl/network/portset.h"
#include "hostctl/network/types.h"

namespace HostCtl::Network {

// Port codes (PnicInfo::port and supportedPorts).
constexpr std::uint32_t PNIC_PORT_TP = 0;
constexpr std::uint32_t PNIC_PORT_AUI = 1;
constexpr std::uint32_t PNIC_PORT_BNC = 2;
constexpr std::uint32_t PNIC_PORT_MII = 3;
constexpr std::uint32_t PNIC_PORT_FIBRE = 4;
constexpr std::uint32_t PNIC_PORT_DA = 5;

// Duplex codes. GetDuplex() gives FULL or HALF; a link mode may say AUTO.
constexpr std::uint32_t PNIC_DUPLEX_AUTO = 0;
constexpr std::uint32_t PNIC_DUPLEX_FULL = 1;
constexpr std::uint32_t PNIC_DUPLEX_HALF = 2;

// Transceiver codes.
constexpr std::uint32_t PNIC_TRANSCEIVER_INTERNAL = 0;
constexpr std::uint32_t PNIC_TRANSCEIVER_EXTERNAL = 1;

// What wakes the host up.
enum WakeOnMode : std::uint32_t {
    WAKE_ON_PHY = 0,
    WAKE_ON_UNICAST = 1,
    WAKE_ON_MULTICAST = 2,
    WAKE_ON_BROADCAST = 3,
    WAKE_ON_ARP = 4,
    WAKE_ON_MAGIC = 5,
    WAKE_ON_SECURE_ON = 6,
    WAKE_ON_UNSUPPORTED = 7,
    WAKE_ON_DISABLED = 8,
};

// A link mode: speed in Mbps (0: auto-negotiated), duplex code, media code (0..26).
struct PnicLinkMode {
    std::uint32_t speed = 0;
    std::uint32_t duplex = PNIC_DUPLEX_AUTO;
    std::uint32_t media = 0;
};

// The general settings of an adapter. SetPnicInfo applies only the attributes whose change
// mark is set; the other fields are what GetPnicInfo reports.
struct PnicInfo {
    std::vector<std::uint32_t> supportedPorts;
    bool supportsAutoNegotiation = false;
    std::vector<PnicLinkMode> advertisedLinkModes;
    bool advertisedAutoNegotiation = false;
    std::uint32_t port = PNIC_PORT_TP;
    std::int64_t phyAddress = 0;
    std::uint32_t transceiver = PNIC_TRANSCEIVER_INTERNAL;
    bool autoNegotiation = false;
    bool supportsWakeOn = false;
    std::vector<WakeOnMode> wakeOn;
    bool messageLevelSupported = false;
    std::int64_t messageLevel = 0;
    std::string virtualAddress;
    // "Up" or "Down".
    std::string linkStatus;

    // Change marks.
    bool portChanged = false;
    bool phyAddressChanged = false;
    bool virtualAddressChanged = false;
    bool transceiverChanged = false;
    bool wakeOnChanged = false;
    bool messageLevelChanged = false;
};

// Flow control. The resolution codes say what auto-negotiation agreed on: 0 nothing
// (negotiation off or no link), 1 pause on, 2 pause off.
struct PnicPauseParams {
    bool supported = false;
    bool autoNegotiate = false;
    bool rx = false;
    bool tx = false;
    std::uint32_t rxResolution = 0;
    std::uint32_t txResolution = 0;
};

struct PnicDriverInfo {
    std::string driver;
    std::string version;
    std::string firmwareVersion;
    std::string busInfo;
};

// The PCI function of an adapter.
class PciDevice {
public:
    PciDevice(std::string address, std::string vendorName, std::string deviceName)
        : address_(std::move(address)),
          vendorName_(std::move(vendorName)),
          deviceName_(std::move(deviceName)) {}

    // "0000:04:00.0".
    const std::string& GetAddressString() const { return address_; }
    const std::string& GetVendorName() const { return vendorName_; }
    const std::string& GetDeviceName() const { return deviceName_; }

private:
    std::string address_;
    std::string vendorName_;
    std::string deviceName_;
};

// Interrupt coalescing. Times in microseconds, rates in packets per second, the sample
// interval in seconds. SetCoalesceParams applies the whole record, so a change is a
// read-modify-write; the driver fields at the end are carried through unchanged.
struct PnicCoalesceParams {
    bool adaptiveRx = false;
    bool adaptiveTx = false;
    std::uint32_t sampleInterval = 0;
    std::uint32_t pktRateLow = 0;
    std::uint32_t pktRateHigh = 0;
    std::uint32_t rxUsecs = 0;
    std::uint32_t rxMaxFrames = 0;
    std::uint32_t txUsecs = 0;
    std::uint32_t txMaxFrames = 0;
    std::uint32_t rxUsecsLow = 0;
    std::uint32_t rxMaxFramesLow = 0;
    std::uint32_t txUsecsLow = 0;
    std::uint32_t txMaxFramesLow = 0;
    std::uint32_t rxUsecsHigh = 0;
    std::uint32_t rxMaxFramesHigh = 0;
    std::uint32_t txUsecsHigh = 0;
    std::uint32_t txMaxFramesHigh = 0;
    std::uint32_t rxUsecsIrq = 0;
    std::uint32_t rxMaxFramesIrq = 0;
    std::uint32_t txUsecsIrq = 0;
    std::uint32_t txMaxFramesIrq = 0;
    std::uint32_t statsBlockUsecs = 0;
};

// Offload switches; SetOffloadSettings applies those selected by the mask.
constexpr std::uint8_t PNIC_OFFLOAD_RX_CSUM = 0x1;
constexpr std::uint8_t PNIC_OFFLOAD_TX_CSUM = 0x2;
constexpr std::uint8_t PNIC_OFFLOAD_SG = 0x4;
constexpr std::uint8_t PNIC_OFFLOAD_TSO = 0x8;
constexpr std::uint8_t PNIC_OFFLOAD_GSO = 0x10;
constexpr std::uint8_t PNIC_OFFLOAD_GRO = 0x20;
constexpr std::uint8_t PNIC_OFFLOAD_LRO = 0x40;

struct PnicOffloadSettings {
    std::uint8_t mask = 0;
    bool rxChecksum = false;
    bool txChecksum = false;
    bool scatterGather = false;
    bool tso = false;
    bool gso = false;
    bool gro = false;
    bool lro = false;
};

// Ring sizes: the preset maxima and the current sizes. SetRingParams applies the current
// sizes selected by the mask.
constexpr std::uint8_t PNIC_RING_RX = 0x1;
constexpr std::uint8_t PNIC_RING_RX_MINI = 0x2;
constexpr std::uint8_t PNIC_RING_RX_JUMBO = 0x4;
constexpr std::uint8_t PNIC_RING_TX = 0x8;

struct PnicRingParams {
    std::uint8_t mask = 0;
    std::uint32_t rxMax = 0;
    std::uint32_t rxMiniMax = 0;
    std::uint32_t rxJumboMax = 0;
    std::uint32_t txMax = 0;
    std::uint32_t rx = 0;
    std::uint32_t rxMini = 0;
    std::uint32_t rxJumbo = 0;
    std::uint32_t tx = 0;
};

// Software simulation of offload features; SetSoftwareSettings applies the switches
// selected by the mask.
constexpr std::uint32_t PNIC_SW_IPV4_CSO = 0x1;
constexpr std::uint32_t PNIC_SW_IPV4_TSO = 0x2;
constexpr std::uint32_t PNIC_SW_SG = 0x4;
constexpr std::uint32_t PNIC_SW_OBO = 0x8;
constexpr std::uint32_t PNIC_SW_VXLAN_ENCAP = 0x10;
constexpr std::uint32_t PNIC_SW_IPV6_TSO = 0x20;
constexpr std::uint32_t PNIC_SW_IPV6_TSO_EXT = 0x40;
constexpr std::uint32_t PNIC_SW_IPV6_CSO = 0x80;
constexpr std::uint32_t PNIC_SW_IPV6_CSO_EXT = 0x100;
constexpr std::uint32_t PNIC_SW_HIGH_DMA = 0x200;
constexpr std::uint32_t PNIC_SW_SG_SPAN_PAGES = 0x400;
constexpr std::uint32_t PNIC_SW_VLAN_TAGGING = 0x800;
constexpr std::uint32_t PNIC_SW_VLAN_UNTAGGING = 0x1000;
constexpr std::uint32_t PNIC_SW_GENEVE_OFFLOAD = 0x2000;

struct PnicSoftwareSettings {
    std::uint32_t mask = 0;
    bool ipv4Cso = false;
    bool ipv4Tso = false;
    bool sg = false;
    bool obo = false;
    bool vxlanEncap = false;
    bool ipv6Tso = false;
    bool ipv6TsoExt = false;
    bool ipv6Cso = false;
    bool ipv6CsoExt = false;
    bool highDma = false;
    bool sgSpanPages = false;
    bool vlanTagging = false;
    bool vlanUntagging = false;
    bool geneveOffload = false;
};

// Packet counters of an adapter.
struct PnicStats {
    std::uint64_t rxPackets = 0;
    std::uint64_t txPackets = 0;
    std::uint64_t rxBytes = 0;
    std::uint64_t txBytes = 0;
    std::uint64_t rxDropped = 0;
    std::uint64_t txDropped = 0;
    std::uint64_t rxMulticast = 0;
    std::uint64_t rxBroadcast = 0;
    std::uint64_t txMulticast = 0;
    std::uint64_t txBroadcast = 0;
    std::uint64_t rxErrors = 0;
    std::uint64_t rxLengthErrors = 0;
    std::uint64_t rxOverErrors = 0;
    std::uint64_t rxCrcErrors = 0;
    std::uint64_t rxFrameErrors = 0;
    std::uint64_t rxFifoErrors = 0;
    std::uint64_t rxMissedErrors = 0;
    std::uint64_t txErrors = 0;
    std::uint64_t txAbortedErrors = 0;
    std::uint64_t txCarrierErrors = 0;
    std::uint64_t txFifoErrors = 0;
    std::uint64_t txHeartbeatErrors = 0;
    std::uint64_t txWindowErrors = 0;
};

// What a driver self test reports: whether a test failed and one line per test.
struct PnicSelfTestResult {
    bool failed = false;
    std::vector<std::string> info;
};

// Netqueue load-balancer features, as mask bits; index i of the flag arrays is bit 1 << i.
constexpr std::uint32_t PNIC_NETQ_LB_RXQPAIR = 0x1;
constexpr std::uint32_t PNIC_NETQ_LB_RXQNOFEATURE = 0x2;
constexpr std::uint32_t PNIC_NETQ_LB_PREEMPTIBLEQ = 0x4;
constexpr std::uint32_t PNIC_NETQ_LB_RXQLATENCY = 0x8;
constexpr std::uint32_t PNIC_NETQ_LB_RXDYNAMICLB = 0x10;
constexpr std::uint32_t PNIC_NETQ_LB_DYNAMICQPOOL = 0x20;
constexpr std::uint32_t PNIC_NETQ_LB_MACLEARNLB = 0x40;
constexpr std::uint32_t PNIC_NETQ_LB_RSS = 0x80;
constexpr std::uint32_t PNIC_NETQ_LB_LRO = 0x100;
constexpr std::uint32_t PNIC_NETQ_LB_GENEVEOAM = 0x200;
constexpr std::size_t PNIC_NETQ_LB_FEATURE_COUNT = 10;

struct PnicNetqueuePluginInfo {
    std::string moduleName;
    std::string pluginName;
    std::string description;
};

// The netqueue record. GetNetqueueInfo fills everything but the marks; SetNetqueueInfo
// applies the parts its marks select: the "allowed" flags of the features in lbMask, the TX
// and RX counts, the balancer state, and the plugin state (pluginEnabled) of every plugin
// listed in plugins.
struct PnicNetqueueInfo {
    std::uint32_t lbMask = 0;
    std::uint32_t txQueueCount = 0;
    std::uint32_t rxQueueCount = 0;
    bool setTxCount = false;
    bool setRxCount = false;
    bool stateChanged = false;
    bool pluginChanged = false;
    bool balancerEnabled = false;
    bool pluginEnabled = false;
    std::array<bool, PNIC_NETQ_LB_FEATURE_COUNT> lbAllowed{};
    std::array<bool, PNIC_NETQ_LB_FEATURE_COUNT> lbSupported{};
    bool filterMacOnly = false;
    bool filterVlanOnly = false;
    bool filterVlanMac = false;
    bool filterVxlan = false;
    bool filterGeneve = false;
    bool filterGenericEncap = false;
    std::vector<PnicNetqueuePluginInfo> plugins;
    std::vector<PnicNetqueuePluginInfo> enabledPlugins;
};

// A virtual function of an SR-IOV adapter; the owner is a World ID, empty when the VF is free.
struct SriovNicVFInfo {
    std::uint8_t vfId = 0;
    bool active = false;
    std::string pciAddress;
    std::string ownerWorldId;
};

struct SriovNicVFStats {
    std::uint64_t rxUnicastPkts = 0;
    std::uint64_t rxUnicastBytes = 0;
    std::uint64_t rxMulticastPkts = 0;
    std::uint64_t rxMulticastBytes = 0;
    std::uint64_t rxBroadcastPkts = 0;
    std::uint64_t rxBroadcastBytes = 0;
    std::uint64_t rxOutOfBufferDrops = 0;
    std::uint64_t rxErrorDrops = 0;
    std::uint64_t rxLroPkts = 0;
    std::uint64_t rxLroBytes = 0;
    std::uint64_t txUnicastPkts = 0;
    std::uint64_t txUnicastBytes = 0;
    std::uint64_t txMulticastPkts = 0;
    std::uint64_t txMulticastBytes = 0;
    std::uint64_t txBroadcastPkts = 0;
    std::uint64_t txBroadcastBytes = 0;
    std::uint64_t txErrors = 0;
    std::uint64_t txDiscards = 0;
    std::uint64_t txTsoPkts = 0;
    std::uint64_t txTsoBytes = 0;
};

// A physical NIC of the host.
class Pnic {
public:
    virtual ~Pnic();

    virtual std::string GetName() const = 0;
    // The PCI function; nothing for a pseudo adapter (USB and the like).
    virtual std::unique_ptr<PciDevice> GetPciDevice() const = 0;
    // What a pseudo adapter says it is; "USB-NIC:<vendor>:<device>" for a USB adapter.
    virtual std::string GetDeviceDescription() const = 0;
    virtual std::string GetDriverName() const = 0;

    // Link: carrier detected on an adapter that is up.
    virtual bool IsLinkUp() const = 0;
    virtual bool IsLinkStatusUp() const = 0;
    virtual bool IsAdminUp() const = 0;
    // Mbps; 0 without link.
    virtual std::uint32_t GetLinkSpeed() const = 0;
    // PNIC_DUPLEX_FULL or PNIC_DUPLEX_HALF (half without link).
    virtual std::uint32_t GetDuplex() const = 0;
    virtual MacAddress GetMacAddress() const = 0;
    virtual std::uint32_t GetMtu() const = 0;

    // Brings the adapter up (its link returns when it has a carrier) or down.
    virtual void SetAdminUp(bool up) = 0;
    virtual void GetPnicInfo(PnicInfo& info) const = 0;
    virtual void SetPnicInfo(const PnicInfo& info) = 0;
    virtual void GetDriverInfo(PnicDriverInfo& info) const = 0;
    // Forces a speed (Mbps) and duplex (PNIC_DUPLEX_FULL or PNIC_DUPLEX_HALF) the adapter
    // supports; (0, 0) turns auto-negotiation on.
    virtual void SetSpeedDuplex(std::uint32_t speed, std::uint32_t duplex) = 0;

    virtual void GetPauseParams(PnicPauseParams& pause) const = 0;
    // Applies auto-negotiation, RX and TX pause.
    virtual void SetPauseParams(const PnicPauseParams& pause) = 0;
    virtual void GetCoalesceParams(PnicCoalesceParams& params) const = 0;
    virtual void SetCoalesceParams(const PnicCoalesceParams& params) = 0;
    virtual void GetOffloadSettings(PnicOffloadSettings& settings) const = 0;
    virtual void SetOffloadSettings(const PnicOffloadSettings& settings) = 0;
    virtual void GetRingParams(PnicRingParams& params) const = 0;
    virtual void SetRingParams(const PnicRingParams& params) = 0;
    virtual void GetSoftwareSettings(PnicSoftwareSettings& settings) const = 0;
    virtual void SetSoftwareSettings(const PnicSoftwareSettings& settings) = 0;
    // Diagnostics. The register image in register order.
    virtual void GetRegisterDump(std::vector<std::uint8_t>& bytes) const = 0;
    // EEPROM bytes from offset on: length of them (0: to the end), cut at the end of the
    // EEPROM; an offset outside the EEPROM or a negative length is refused.
    virtual void GetEepromDump(std::vector<std::uint8_t>& bytes, std::int64_t length,
                               std::int64_t offset) const = 0;
    // Writes one double word (little endian) at offset; magic must be the EEPROM's key.
    virtual void SetEepromValue(std::int64_t magic, std::int64_t offset, std::int64_t value) = 0;
    // Writes a file's content from offset 0; the file must be a regular file (not a symbolic
    // link) no larger than the EEPROM.
    virtual void SetEepromFromFile(std::int64_t magic, const std::string& file) = 0;
    // The online test runs only the tests that leave the adapter in service.
    virtual void RunSelfTest(PnicSelfTestResult& result, bool online) = 0;
    // Restarts auto-negotiation; refused when auto-negotiation is off.
    virtual void RestartNegotiation() = 0;

    // Netqueue.
    virtual void GetNetqueueInfo(PnicNetqueueInfo& info) const = 0;
    virtual void SetNetqueueInfo(const PnicNetqueueInfo& info) = 0;
};

}  // namespace HostCtl::Network

namespace TknCtl::Network {

// A physical NIC, named by its name.
class PnicImpl : public HostCtl::Network::Pnic, public TknCtl::Lib::TknCtlObject {
public:
    explicit PnicImpl(std::string name);
    ~PnicImpl() override;

    // True when the host has a physical NIC of that name.
    static bool IsValidPnic(const std::string& name);

    std::string GetName() const override;
    // The NIC's own (uplink) port on the switch that uses it, or nothing.
    std::unique_ptr<HostCtl::Network::Port> GetPort() const;

    std::unique_ptr<HostCtl::Network::PciDevice> GetPciDevice() const override;
    std::string GetDeviceDescription() const override;
    std::string GetDriverName() const override;
    bool IsLinkUp() const override;
    bool IsLinkStatusUp() const override;
    bool IsAdminUp() const override;
    std::uint32_t GetLinkSpeed() const override;
    std::uint32_t GetDuplex() const override;
    HostCtl::Network::MacAddress GetMacAddress() const override;
    std::uint32_t GetMtu() const override;
    void SetAdminUp(bool up) override;
    void GetPnicInfo(HostCtl::Network::PnicInfo& info) const override;
    void SetPnicInfo(const HostCtl::Network::PnicInfo& info) override;
    void GetDriverInfo(HostCtl::Network::PnicDriverInfo& info) const override;
    void SetSpeedDuplex(std::uint32_t speed, std::uint32_t duplex) override;
    void GetPauseParams(HostCtl::Network::PnicPauseParams& pause) const override;
    void SetPauseParams(const HostCtl::Network::PnicPauseParams& pause) override;
    void GetCoalesceParams(HostCtl::Network::PnicCoalesceParams& params) const override;
    void SetCoalesceParams(const HostCtl::Network::PnicCoalesceParams& params) override;
    void GetOffloadSettings(HostCtl::Network::PnicOffloadSettings& settings) const override;
    void SetOffloadSettings(const HostCtl::Network::PnicOffloadSettings& settings) override;
    void GetRingParams(HostCtl::Network::PnicRingParams& params) const override;
    void SetRingParams(const HostCtl::Network::PnicRingParams& params) override;
    void GetSoftwareSettings(HostCtl::Network::PnicSoftwareSettings& settings) const override;
    void SetSoftwareSettings(const HostCtl::Network::PnicSoftwareSettings& settings) override;
    void GetRegisterDump(std::vector<std::uint8_t>& bytes) const override;
    void GetEepromDump(std::vector<std::uint8_t>& bytes, std::int64_t length,
                       std::int64_t offset) const override;
    void SetEepromValue(std::int64_t magic, std::int64_t offset, std::int64_t value) override;
    void SetEepromFromFile(std::int64_t magic, const std::string& file) override;
    void RunSelfTest(HostCtl::Network::PnicSelfTestResult& result, bool online) override;
    void RestartNegotiation() override;
    void GetNetqueueInfo(HostCtl::Network::PnicNetqueueInfo& info) const override;
    void SetNetqueueInfo(const HostCtl::Network::PnicNetqueueInfo& info) override;

    // The adapter's packet counters.
    void GetPnicStats(HostCtl::Network::PnicStats& stats) const;

private:
    std::string name_;
};

}  // namespace TknCtl::Network

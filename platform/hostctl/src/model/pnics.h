// Section "pnics": the physical NICs with their driver settings, counters, diagnostics,
// netqueue and SR-IOV state.
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "core/section.h"
#include "hostctl/network/types.h"

namespace TknCtl::Model {

// Port codes: 0 TP, 1 AUI, 2 BNC, 3 MII, 4 FIBRE, 5 DA. Duplex: 0 auto, 1 full, 2 half.
// Transceiver: 0 internal, 1 external. Wake-on modes: 0 PHY activity, 1 unicast,
// 2 multicast, 3 broadcast, 4 ARP, 5 MagicPacket, 6 SecureOn, 7 unsupported, 8 disabled.

struct PciDevice {
    std::string address;  // "0000:02:00.0"
    std::string vendor;
    std::string device;
};

struct DriverInfo {
    std::string name;
    std::string version;
    std::string firmwareVersion;
    std::string busInfo;
};

struct LinkMode {
    std::uint32_t speed = 0;   // Mbps; 0 auto
    std::uint32_t duplex = 0;  // 0 auto, 1 full, 2 half
    std::uint32_t media = 0;   // 0..26
};

// The general settings of an adapter (what "nic get" shows and "nic set" changes).
struct PnicSettings {
    std::vector<std::uint32_t> supportedPorts;
    bool supportsAutoNegotiation = true;
    // The speeds and duplexes the adapter can run at (absent in the document: the
    // advertised modes).
    std::vector<LinkMode> supportedModes;
    std::vector<LinkMode> advertisedModes;
    bool advertisedAutoNegotiation = true;
    std::uint32_t port = 0;
    std::uint32_t phyAddress = 0;
    std::uint32_t transceiver = 0;
    bool autoNegotiation = true;
    bool supportsWakeOn = false;
    // The Wake-on modes the adapter offers (absent in the document: 0 to 6 when it
    // supports Wake-on at all).
    std::vector<std::uint32_t> supportedWakeOn;
    std::vector<std::uint32_t> wakeOn;
    bool supportsMessageLevel = true;
    std::uint32_t messageLevel = 0;
    std::string virtualAddress;
};

struct PauseParams {
    bool supported = false;
    bool autoNegotiate = false;
    bool rx = false;
    bool tx = false;
    std::uint32_t rxResolution = 0;  // autonegotiation result: 0 unavailable, 1 on, 2 off
    std::uint32_t txResolution = 0;
};

struct CoalesceParams {
    bool adaptiveRx = false;
    bool adaptiveTx = false;
    std::uint32_t sampleInterval = 0;
    std::uint32_t lowPacketRate = 0;
    std::uint32_t highPacketRate = 0;
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
    // Further driver fields, kept as they are.
    std::uint32_t rxUsecsIrq = 0;
    std::uint32_t rxMaxFramesIrq = 0;
    std::uint32_t txUsecsIrq = 0;
    std::uint32_t txMaxFramesIrq = 0;
    std::uint32_t statsBlockUsecs = 0;
};

struct OffloadSettings {
    bool rxChecksum = true;
    bool txChecksum = true;
    bool scatterGather = true;
    bool tso = true;
    bool gso = true;
    bool gro = true;
    bool lro = false;
};

struct RingSizes {
    std::uint32_t rx = 0;
    std::uint32_t rxMini = 0;
    std::uint32_t rxJumbo = 0;
    std::uint32_t tx = 0;
};

struct RingParams {
    RingSizes preset;   // maxima
    RingSizes current;  // in use
};

// Software simulation of offload features, indexed as the mask bits (bit i = 1 << i).
constexpr std::size_t kSoftwareFeatureCount = 14;
inline const char* const kSoftwareFeatureNames[kSoftwareFeatureCount] = {
    "ipv4Cso", "ipv4Tso",    "sg",      "obo",  "vxlanEncap", "ipv6Tso",   "ipv6TsoExt",
    "ipv6Cso", "ipv6CsoExt", "highDma", "sgsp", "tagging",    "untagging", "geneveOffload"};
using SoftwareSettings = std::array<bool, kSoftwareFeatureCount>;

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

struct VlanStats {
    std::uint32_t vlanId = 0;
    std::uint64_t rxPackets = 0;
    std::uint64_t txPackets = 0;
};

struct Eeprom {
    std::uint32_t magic = 0;  // the key a change must give
    std::vector<std::uint8_t> data;
};

struct SelfTestResult {
    bool failed = false;
    std::vector<std::string> info;
};

struct SelfTest {
    SelfTestResult online;
    SelfTestResult offline;
};

// Netqueue load-balancer features, indexed as the mask bits (bit i = 1 << i).
constexpr std::size_t kLbFeatureCount = 10;
inline const char* const kLbFeatureNames[kLbFeatureCount] = {
    "rxQPair",      "rxQNoFeature", "preEmptibleQ", "rxQLatency", "rxDynamicLB",
    "dynamicQPool", "macLearnLB",   "rss",          "lro",        "geneveOam"};

struct LbFeature {
    bool supported = false;
    bool allowed = false;
};

struct FilterClasses {
    bool macOnly = false;
    bool vlanOnly = false;
    bool vlanMac = false;
    bool vxlan = false;
    bool geneve = false;
    bool genericEncap = false;
};

struct NetqueuePlugin {
    std::string module;
    std::string plugin;
    std::string description;
    bool enabled = false;
};

struct Netqueue {
    bool balancerEnabled = true;
    std::array<LbFeature, kLbFeatureCount> features{};
    FilterClasses filterClasses;
    std::uint32_t txQueues = 0;
    std::uint32_t rxQueues = 0;
    std::uint32_t maxTxQueues = 0;  // 0: no limit known
    std::uint32_t maxRxQueues = 0;
    std::vector<NetqueuePlugin> plugins;
};

struct VfStats {
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

struct VirtualFunction {
    std::uint32_t id = 0;  // 0..255
    bool active = false;
    std::string pciAddress;
    std::uint32_t ownerWorldId = 0;  // 0: no owner; else a world of "worlds"
    VfStats stats;
};

struct Sriov {
    bool enabled = false;
    std::uint32_t maxVfs = 0;
    std::vector<VirtualFunction> vfs;
};

// Driver features an adapter may lack; an operation on a feature the adapter lacks fails.
constexpr std::size_t kPnicFeatureCount = 8;
inline const char* const kPnicFeatureNames[kPnicFeatureCount] = {
    "coalesce", "offload", "ring", "software", "registers", "eeprom", "selfTest", "netqueue"};

struct Pnic {
    std::string name;              // "vmnic0"
    std::optional<PciDevice> pci;  // absent: a pseudo adapter
    std::string description;       // pseudo adapters: "USB-NIC:<vendor>:<device>" for USB
    DriverInfo driver;
    bool adminUp = true;
    bool carrier = true;                   // a link partner is there (absent in the document: linkUp)
    bool linkUp = true;                    // link detected: up and with a carrier
    std::uint32_t speed = 0;               // Mbps the link runs at when it is up, as negotiated or forced
    std::uint32_t duplex = 1;              // 1 full, 2 half, likewise
    std::vector<std::string> unsupported;  // features of kPnicFeatureNames the driver lacks
    std::uint32_t mtu = 1500;
    HostCtl::Network::MacAddress mac;
    PnicSettings settings;
    PauseParams pause;
    CoalesceParams coalesce;
    OffloadSettings offload;
    RingParams ring;
    SoftwareSettings software{};
    PnicStats stats;
    bool vlanStatsEnabled = false;
    std::vector<VlanStats> vlanStats;
    Eeprom eeprom;
    std::vector<std::uint8_t> registers;
    SelfTest selfTest;
    Netqueue netqueue;
    Sriov sriov;
};

struct PnicsSection {
    static const Lib::SectionKind& Kind();
    std::vector<Pnic> nics;  // in the host's order

    const Pnic* Find(const std::string& name) const;
    Pnic* Find(const std::string& name);
};

// True when the adapter's driver offers a feature of kPnicFeatureNames.
bool Supports(const Pnic& nic, const char* feature);

// The adapter of that name in the current session, for reading or for changing; both throw
// HostCtlException when the host has no such adapter.
const Pnic& ReadPnic(const std::string& name);
Pnic& WritePnic(const std::string& name);

// Sets what pause auto-negotiation agreed on after a change of link, link negotiation or
// pause settings: nothing without link or negotiation, else the adapter's own choice.
void ResolvePause(Pnic& nic);

// Negotiates the link again: with a carrier on an adapter that is up, the link comes up at the
// fastest advertised mode (full duplex first); pause is resolved again.
void Renegotiate(Pnic& nic);

}  // namespace TknCtl::Model

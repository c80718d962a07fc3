// The tunables of the Linux host's NICs: pause, interrupt coalescing, offloads, ring sizes and
// the software fallbacks of offload features.
#include <linux/ethtool.h>
#include <linux/ethtool_netlink.h>

#include <fnmatch.h>

#include <algorithm>
#include <array>
#include <cstdio>

#include "hostctl/exception.h"
#include "network/pnic.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;
namespace Net = HostCtl::Network;

namespace {

std::string Hex(std::uint32_t value) {
    char text[16];
    std::snprintf(text, sizeof text, "0x%x", value);
    return text;
}

void RequireMask(std::uint32_t mask, std::uint32_t known, const char* what) {
    if (mask & ~known)
        throw HostCtlException("Unknown " + std::string(what) + " mask bits " + Hex(mask & ~known));
}

std::string Join(const std::vector<std::string>& parts) {
    std::string out;
    for (const auto& part : parts)
        out += (out.empty() ? "" : ", ") + part;
    return out;
}

const char* OnOff(bool on) {
    return on ? "on" : "off";
}

}  // namespace

// ---------------------------------------------------------------- pause

std::pair<bool, bool> ResolvePause(bool ourPause, bool ourAsymmetric, bool peerPause, bool peerAsymmetric) {
    const bool asymmetric = ourAsymmetric && peerAsymmetric;
    return {ourPause && (peerPause || asymmetric), peerPause && (ourPause || asymmetric)};
}

// Pause is supported when the driver reports it. What auto-negotiation agreed on is resolved
// from the pause abilities both ends advertise (IEEE 802.3 annex 28B), as ethtool shows it:
// known only while pause auto-negotiation is on, the NIC has a link and its partner's
// abilities are reported.
void LinuxNics::GetPauseParams(const std::string& name, Net::PnicPauseParams& pause) {
    const auto link = Require(name);
    pause = Net::PnicPauseParams();
    const auto reply = GetIfSupported(ETHTOOL_MSG_PAUSE_GET, name, "the pause parameters");
    if (!reply) return;
    pause.supported = true;
    pause.autoNegotiate = reply->Value(ETHTOOL_A_PAUSE_AUTONEG) != 0;
    pause.rx = reply->Value(ETHTOOL_A_PAUSE_RX) != 0;
    pause.tx = reply->Value(ETHTOOL_A_PAUSE_TX) != 0;
    if (!pause.autoNegotiate || !link.lowerUp) return;
    const auto modes = GetIfSupported(ETHTOOL_MSG_LINKMODES_GET, name, "the link modes");
    const auto* ours = modes ? modes->Bitset(ETHTOOL_A_LINKMODES_OURS) : nullptr;
    const auto* peer = modes ? modes->Bitset(ETHTOOL_A_LINKMODES_PEER) : nullptr;
    if (!ours || !peer || peer->bits.empty()) return;
    const auto [rx, tx] = ResolvePause(ours->IsOn("Pause"), ours->IsOn("Asym_Pause"), peer->IsOn("Pause"),
                                       peer->IsOn("Asym_Pause"));
    pause.rxResolution = rx ? 1 : 2;
    pause.txResolution = tx ? 1 : 2;
}

void LinuxNics::SetPauseParams(const std::string& name, const Net::PnicPauseParams& pause) {
    Require(name);
    context_.RequireUndoable(Context::kDriverSettings);
    context_.BeginChange();
    Change(Kernel::BuildEthtoolSet(Ethtool().Family(), ETHTOOL_MSG_PAUSE_SET, name,
                                   {{ETHTOOL_A_PAUSE_AUTONEG, pause.autoNegotiate},
                                    {ETHTOOL_A_PAUSE_RX, pause.rx},
                                    {ETHTOOL_A_PAUSE_TX, pause.tx}}),
           name, "the pause parameters");
    if (Kernel::DryRun()) return;  // a dry run changed nothing to read back
    const auto now = Get(ETHTOOL_MSG_PAUSE_GET, name, "the pause parameters");
    const bool autoneg = now.Value(ETHTOOL_A_PAUSE_AUTONEG) != 0, rx = now.Value(ETHTOOL_A_PAUSE_RX) != 0,
               tx = now.Value(ETHTOOL_A_PAUSE_TX) != 0;
    if (autoneg != pause.autoNegotiate || rx != pause.rx || tx != pause.tx) {
        throw HostCtlException(name + " holds pause autonegotiate " + OnOff(autoneg) + ", RX " + OnOff(rx) +
                               ", TX " + OnOff(tx) + " after it was set to " + OnOff(pause.autoNegotiate) +
                               ", " + OnOff(pause.rx) + ", " + OnOff(pause.tx));
    }
}

// ---------------------------------------------------------------- coalescing

namespace {

using Coalesce = Net::PnicCoalesceParams;

// The record's fields as the kernel's attributes, named as ethtool -C names them. The
// booleans are held as 0 and 1.
struct CoalesceField {
    int attribute;
    const char* name;
    std::uint32_t Coalesce::*number;
    bool Coalesce::*flag;
};

const CoalesceField kCoalesce[] = {
    {ETHTOOL_A_COALESCE_USE_ADAPTIVE_RX, "adaptive-rx", nullptr, &Coalesce::adaptiveRx},
    {ETHTOOL_A_COALESCE_USE_ADAPTIVE_TX, "adaptive-tx", nullptr, &Coalesce::adaptiveTx},
    {ETHTOOL_A_COALESCE_RATE_SAMPLE_INTERVAL, "sample-interval", &Coalesce::sampleInterval, nullptr},
    {ETHTOOL_A_COALESCE_PKT_RATE_LOW, "pkt-rate-low", &Coalesce::pktRateLow, nullptr},
    {ETHTOOL_A_COALESCE_PKT_RATE_HIGH, "pkt-rate-high", &Coalesce::pktRateHigh, nullptr},
    {ETHTOOL_A_COALESCE_RX_USECS, "rx-usecs", &Coalesce::rxUsecs, nullptr},
    {ETHTOOL_A_COALESCE_RX_MAX_FRAMES, "rx-frames", &Coalesce::rxMaxFrames, nullptr},
    {ETHTOOL_A_COALESCE_TX_USECS, "tx-usecs", &Coalesce::txUsecs, nullptr},
    {ETHTOOL_A_COALESCE_TX_MAX_FRAMES, "tx-frames", &Coalesce::txMaxFrames, nullptr},
    {ETHTOOL_A_COALESCE_RX_USECS_LOW, "rx-usecs-low", &Coalesce::rxUsecsLow, nullptr},
    {ETHTOOL_A_COALESCE_RX_MAX_FRAMES_LOW, "rx-frames-low", &Coalesce::rxMaxFramesLow, nullptr},
    {ETHTOOL_A_COALESCE_TX_USECS_LOW, "tx-usecs-low", &Coalesce::txUsecsLow, nullptr},
    {ETHTOOL_A_COALESCE_TX_MAX_FRAMES_LOW, "tx-frames-low", &Coalesce::txMaxFramesLow, nullptr},
    {ETHTOOL_A_COALESCE_RX_USECS_HIGH, "rx-usecs-high", &Coalesce::rxUsecsHigh, nullptr},
    {ETHTOOL_A_COALESCE_RX_MAX_FRAMES_HIGH, "rx-frames-high", &Coalesce::rxMaxFramesHigh, nullptr},
    {ETHTOOL_A_COALESCE_TX_USECS_HIGH, "tx-usecs-high", &Coalesce::txUsecsHigh, nullptr},
    {ETHTOOL_A_COALESCE_TX_MAX_FRAMES_HIGH, "tx-frames-high", &Coalesce::txMaxFramesHigh, nullptr},
    {ETHTOOL_A_COALESCE_RX_USECS_IRQ, "rx-usecs-irq", &Coalesce::rxUsecsIrq, nullptr},
    {ETHTOOL_A_COALESCE_RX_MAX_FRAMES_IRQ, "rx-frames-irq", &Coalesce::rxMaxFramesIrq, nullptr},
    {ETHTOOL_A_COALESCE_TX_USECS_IRQ, "tx-usecs-irq", &Coalesce::txUsecsIrq, nullptr},
    {ETHTOOL_A_COALESCE_TX_MAX_FRAMES_IRQ, "tx-frames-irq", &Coalesce::txMaxFramesIrq, nullptr},
    {ETHTOOL_A_COALESCE_STATS_BLOCK_USECS, "stats-block-usecs", &Coalesce::statsBlockUsecs, nullptr},
};

std::uint32_t FieldValue(const Coalesce& params, const CoalesceField& field) {
    return field.number ? params.*field.number : static_cast<std::uint32_t>(params.*field.flag);
}

}  // namespace

// A parameter the driver does not keep reads as 0 (the kernel reports only those it keeps).
void LinuxNics::GetCoalesceParams(const std::string& name, Net::PnicCoalesceParams& params) {
    Require(name);
    const auto reply = Get(ETHTOOL_MSG_COALESCE_GET, name, "the coalesce parameters");
    params = Net::PnicCoalesceParams();
    for (const auto& field : kCoalesce) {
        const auto value = static_cast<std::uint32_t>(reply.Value(field.attribute, 0));
        if (field.number) {
            params.*field.number = value;
        } else {
            params.*field.flag = value != 0;
        }
    }
}

// Only the parameters that differ from what the driver holds are sent: a driver refuses any
// parameter it does not keep, even one set to what it reads as.
void LinuxNics::SetCoalesceParams(const std::string& name, const Net::PnicCoalesceParams& params) {
    Require(name);
    const auto current = Get(ETHTOOL_MSG_COALESCE_GET, name, "the coalesce parameters");
    std::map<int, std::uint32_t> changes;
    std::vector<std::string> unsupported;
    for (const auto& field : kCoalesce) {
        const std::uint32_t wanted = FieldValue(params, field);
        if (wanted == current.Value(field.attribute, 0)) continue;
        if (!current.Has(field.attribute)) unsupported.push_back(field.name);
        changes[field.attribute] = wanted;
    }
    if (!unsupported.empty()) {
        throw HostCtlException("Cannot change the coalesce parameters of " + name + ": the driver (" +
                               DriverOf(name) + ") does not support " + Join(unsupported));
    }
    if (changes.empty()) return;
    context_.RequireUndoable(Context::kDriverSettings);
    context_.BeginChange();
    Change(Kernel::BuildEthtoolSet(Ethtool().Family(), ETHTOOL_MSG_COALESCE_SET, name, changes), name,
           "the coalesce parameters");
    if (Kernel::DryRun()) return;  // a dry run changed nothing to read back
    const auto now = Get(ETHTOOL_MSG_COALESCE_GET, name, "the coalesce parameters");
    for (const auto& field : kCoalesce) {
        auto it = changes.find(field.attribute);
        if (it == changes.end() || now.Value(field.attribute, 0) == it->second) continue;
        throw HostCtlException(name + " holds " + field.name + " " +
                               std::to_string(now.Value(field.attribute, 0)) + " after it was set to " +
                               std::to_string(it->second));
    }
}

// ---------------------------------------------------------------- offloads

namespace {

using Offload = Net::PnicOffloadSettings;

// Each switch of the offload record is a group of the kernel's features, named by a pattern
// as ethtool names its legacy switches ("tx-checksumming" is every tx-checksum-* feature); a
// switch is on when any feature of its group is active, and a change asks for every feature of
// the group the driver lets change.
struct FeatureGroup {
    std::uint8_t bit;
    const char* what;
    const char* pattern;
    bool Offload::*field;
};

const FeatureGroup kOffloads[] = {
    {Net::PNIC_OFFLOAD_RX_CSUM, "RX checksum offload", "rx-checksum", &Offload::rxChecksum},
    {Net::PNIC_OFFLOAD_TX_CSUM, "TX checksum offload", "tx-checksum-*", &Offload::txChecksum},
    {Net::PNIC_OFFLOAD_SG, "scatter-gather", "tx-scatter-gather*", &Offload::scatterGather},
    {Net::PNIC_OFFLOAD_TSO, "TCP segmentation offload", "tx-tcp*-segmentation", &Offload::tso},
    {Net::PNIC_OFFLOAD_GSO, "generic segmentation offload", "tx-generic-segmentation", &Offload::gso},
    {Net::PNIC_OFFLOAD_GRO, "generic receive offload", "rx-gro", &Offload::gro},
    {Net::PNIC_OFFLOAD_LRO, "large receive offload", "rx-lro", &Offload::lro},
};

// The features of a list (the active or the changeable ones) that a group's pattern names.
std::vector<std::string> Matching(const Kernel::EthtoolBitset& set, const char* pattern) {
    std::vector<std::string> names;
    for (const auto& bit : set.bits) {
        if (bit.on && fnmatch(pattern, bit.name.c_str(), 0) == 0) names.push_back(bit.name);
    }
    return names;
}

const Kernel::EthtoolBitset& FeatureSet(const Kernel::EthtoolReply& reply, int attribute) {
    static const Kernel::EthtoolBitset kEmpty;
    const auto* set = reply.Bitset(attribute);
    return set ? *set : kEmpty;
}

}  // namespace

Kernel::EthtoolReply LinuxNics::Features(const std::string& name) {
    return Get(ETHTOOL_MSG_FEATURES_GET, name, "the offload features");
}

void LinuxNics::ChangeFeatures(const std::string& name,
                               const std::vector<std::pair<std::string, bool>>& wanted,
                               const std::string& what) {
    if (wanted.empty()) return;
    context_.RequireUndoable(Context::kDriverSettings);
    context_.BeginChange();
    Change(Kernel::BuildFeaturesSet(Ethtool().Family(), name, wanted), name, what);
    if (Kernel::DryRun()) return;  // a dry run changed nothing to read back
    const auto now = Features(name);
    std::vector<std::string> kept;
    for (const auto& [feature, on] : wanted) {
        if (FeatureSet(now, ETHTOOL_A_FEATURES_ACTIVE).IsOn(feature) != on)
            kept.push_back(feature + std::string(" ") + OnOff(!on));
    }
    if (!kept.empty())
        throw HostCtlException("Cannot change " + what + " of " + name + ": the kernel keeps " + Join(kept));
}

void LinuxNics::GetOffloadSettings(const std::string& name, Net::PnicOffloadSettings& settings) {
    Require(name);
    const auto features = Features(name);
    const auto& active = FeatureSet(features, ETHTOOL_A_FEATURES_ACTIVE);
    for (const auto& group : kOffloads)
        settings.*group.field = !Matching(active, group.pattern).empty();
}

void LinuxNics::SetOffloadSettings(const std::string& name, const Net::PnicOffloadSettings& settings) {
    Require(name);
    RequireMask(settings.mask, 0x7f, "offload");
    const auto features = Features(name);
    const auto& active = FeatureSet(features, ETHTOOL_A_FEATURES_ACTIVE);
    const auto& changeable = FeatureSet(features, ETHTOOL_A_FEATURES_HW);
    std::vector<std::pair<std::string, bool>> wanted;
    std::vector<std::string> whats;
    for (const auto& group : kOffloads) {
        if (!(settings.mask & group.bit)) continue;
        const bool on = settings.*group.field;
        const auto activeNow = Matching(active, group.pattern);
        const auto free = Matching(changeable, group.pattern);
        auto isFree = [&](const std::string& feature) {
            return std::find(free.begin(), free.end(), feature) != free.end();
        };
        // On: one feature of the group on is enough. Off: every one must go off.
        std::vector<std::string> fixed;
        bool reachable = on ? !activeNow.empty() || !free.empty() : true;
        if (!on) {
            for (const auto& feature : activeNow) {
                if (!isFree(feature)) fixed.push_back(feature);
            }
            reachable = fixed.empty();
        }
        if (!reachable) {
            throw HostCtlException("Cannot turn " + std::string(OnOff(on)) + " " + group.what + " on " +
                                   name + ": the driver (" + DriverOf(name) + ") does not let it change" +
                                   (fixed.empty() ? std::string() : " (it keeps " + Join(fixed) + " on)"));
        }
        for (const auto& feature : free) {
            const bool isOn = std::find(activeNow.begin(), activeNow.end(), feature) != activeNow.end();
            if (isOn != on) wanted.emplace_back(feature, on);
        }
        whats.push_back(group.what);
    }
    ChangeFeatures(name, wanted, Join(whats));
}

// ---------------------------------------------------------------- rings

void LinuxNics::GetRingParams(const std::string& name, Net::PnicRingParams& params) {
    Require(name);
    const auto rings = Get(ETHTOOL_MSG_RINGS_GET, name, "the ring sizes");
    auto value = [&](int attribute) { return static_cast<std::uint32_t>(rings.Value(attribute, 0)); };
    params.rxMax = value(ETHTOOL_A_RINGS_RX_MAX);
    params.rxMiniMax = value(ETHTOOL_A_RINGS_RX_MINI_MAX);
    params.rxJumboMax = value(ETHTOOL_A_RINGS_RX_JUMBO_MAX);
    params.txMax = value(ETHTOOL_A_RINGS_TX_MAX);
    params.rx = value(ETHTOOL_A_RINGS_RX);
    params.rxMini = value(ETHTOOL_A_RINGS_RX_MINI);
    params.rxJumbo = value(ETHTOOL_A_RINGS_RX_JUMBO);
    params.tx = value(ETHTOOL_A_RINGS_TX);
}

void LinuxNics::SetRingParams(const std::string& name, const Net::PnicRingParams& params) {
    Require(name);
    RequireMask(params.mask, 0xf, "ring");
    std::map<int, std::uint32_t> sizes;
    if (params.mask & Net::PNIC_RING_RX) sizes[ETHTOOL_A_RINGS_RX] = params.rx;
    if (params.mask & Net::PNIC_RING_RX_MINI) sizes[ETHTOOL_A_RINGS_RX_MINI] = params.rxMini;
    if (params.mask & Net::PNIC_RING_RX_JUMBO) sizes[ETHTOOL_A_RINGS_RX_JUMBO] = params.rxJumbo;
    if (params.mask & Net::PNIC_RING_TX) sizes[ETHTOOL_A_RINGS_TX] = params.tx;
    if (sizes.empty()) return;
    context_.RequireUndoable(Context::kDriverSettings);
    context_.BeginChange();
    Change(Kernel::BuildEthtoolSet(Ethtool().Family(), ETHTOOL_MSG_RINGS_SET, name, sizes), name,
           "the ring sizes");
    if (Kernel::DryRun()) return;  // a dry run changed nothing to read back
    const auto now = Get(ETHTOOL_MSG_RINGS_GET, name, "the ring sizes");
    static const std::pair<int, const char*> kNames[] = {{ETHTOOL_A_RINGS_RX, "RX"},
                                                         {ETHTOOL_A_RINGS_RX_MINI, "RX mini"},
                                                         {ETHTOOL_A_RINGS_RX_JUMBO, "RX jumbo"},
                                                         {ETHTOOL_A_RINGS_TX, "TX"}};
    for (const auto& [attribute, ring] : kNames) {
        auto it = sizes.find(attribute);
        if (it == sizes.end() || now.Value(attribute, 0) == it->second) continue;
        throw HostCtlException(name + " holds an " + std::string(ring) + " ring of " +
                               std::to_string(now.Value(attribute, 0)) + " entries after it was set to " +
                               std::to_string(it->second));
    }
}

// ---------------------------------------------------------------- software fallbacks

namespace {

using Software = Net::PnicSoftwareSettings;

// What the kernel does in software for a NIC that cannot do it itself. Checksums, scatter-
// gather (the kernel linearizes the packet), buffers beyond the NIC's DMA reach, VLAN tag
// insertion and removal are always done so: those switches read on and cannot be turned off.
// Segmentation, plain and of encapsulated packets, is generic segmentation offload (the
// feature tx-generic-segmentation): those switches read and set that one feature.
struct SoftwareSwitch {
    bool Software::*field;
    const char* what;
    bool segmentation;
};

const SoftwareSwitch kSoftware[] = {
    {&Software::ipv4Cso, "IPv4 checksums", false},
    {&Software::ipv4Tso, "IPv4 TCP segmentation", true},
    {&Software::sg, "scatter-gather", false},
    {&Software::obo, "offset based encapsulation offload", true},
    {&Software::vxlanEncap, "VXLAN encapsulation offload", true},
    {&Software::ipv6Tso, "IPv6 TCP segmentation", true},
    {&Software::ipv6TsoExt, "IPv6 TCP segmentation with extension headers", true},
    {&Software::ipv6Cso, "IPv6 checksums", false},
    {&Software::ipv6CsoExt, "IPv6 checksums with extension headers", false},
    {&Software::highDma, "high DMA (bounce buffers)", false},
    {&Software::sgSpanPages, "scatter-gather across pages", false},
    {&Software::vlanTagging, "TX VLAN tagging", false},
    {&Software::vlanUntagging, "RX VLAN untagging", false},
    {&Software::geneveOffload, "Geneve encapsulation offload", true},
};

constexpr const char* kGso = "tx-generic-segmentation";

}  // namespace

void LinuxNics::GetSoftwareSettings(const std::string& name, Net::PnicSoftwareSettings& settings) {
    Require(name);
    const bool gso = FeatureSet(Features(name), ETHTOOL_A_FEATURES_ACTIVE).IsOn(kGso);
    for (const auto& sw : kSoftware)
        settings.*sw.field = sw.segmentation ? gso : true;
}

void LinuxNics::SetSoftwareSettings(const std::string& name, const Net::PnicSoftwareSettings& settings) {
    Require(name);
    RequireMask(settings.mask, (1u << std::size(kSoftware)) - 1, "software simulation");
    std::optional<bool> gso;
    std::vector<std::string> segmentation;
    for (std::size_t i = 0; i < std::size(kSoftware); ++i) {
        if (!(settings.mask & (1u << i))) continue;
        const auto& sw = kSoftware[i];
        const bool on = settings.*sw.field;
        if (!sw.segmentation) {
            if (!on) {
                throw HostCtlException("Linux always does " + std::string(sw.what) +
                                       " in software for a NIC that cannot: it cannot be turned off");
            }
            continue;
        }
        segmentation.push_back(sw.what);
        if (gso && *gso != on) {
            throw HostCtlException(
                "Linux does " + Join(segmentation) +
                " in software with one switch, generic segmentation offload (tx-generic-segmentation): "
                "give them the same value");
        }
        gso = on;
    }
    if (!gso) return;
    if (FeatureSet(Features(name), ETHTOOL_A_FEATURES_ACTIVE).IsOn(kGso) == *gso) return;
    ChangeFeatures(name, {{kGso, *gso}}, "generic segmentation offload");
}

}  // namespace TknCtl::Linux

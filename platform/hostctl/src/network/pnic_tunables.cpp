// Physical NICs: pause, interrupt coalescing, offloads, rings and the software simulation
// of offload features.
#include <array>
#include <cstdio>

#include "backend/nics.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/nic.h"
#include "model/pnics.h"

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;
namespace Net = HostCtl::Network;

namespace {

const Model::Pnic& Enter(const char* operation, const std::string& name, const std::string& arguments = {}) {
    Lib::Enter(std::string("HostCtl::Network::Pnic::") + operation, name, arguments);
    return Model::ReadPnic(name);
}

// The real host's NICs, when the session manages one.
Backend::Nics* Real(const char* operation, const std::string& name) {
    return Backend::EnterRealNics(std::string("HostCtl::Network::Pnic::") + operation, name);
}

// Fails when the adapter's driver lacks a feature; what names it for the message.
void Require(const Model::Pnic& nic, const char* feature, const char* what) {
    if (!Model::Supports(nic, feature))
        throw HostCtlException(nic.name + " does not support " + what + " (driver " + nic.driver.name + ")");
}

std::string Hex(std::uint32_t value) {
    char text[16];
    std::snprintf(text, sizeof text, "0x%x", value);
    return text;
}

void RequireMask(std::uint32_t mask, std::uint32_t known, const char* what) {
    if (mask & ~known)
        throw HostCtlException("Unknown " + std::string(what) + " mask bits " + Hex(mask & ~known));
}

}  // namespace

// ---------------------------------------------------------------- pause

void PnicImpl::GetPauseParams(Net::PnicPauseParams& pause) const {
    if (auto* nics = Real("GetPauseParams", name_)) return nics->GetPauseParams(name_, pause);
    const auto& p = Enter("GetPauseParams", name_).pause;
    pause.supported = p.supported;
    pause.autoNegotiate = p.autoNegotiate;
    pause.rx = p.rx;
    pause.tx = p.tx;
    pause.rxResolution = p.rxResolution;
    pause.txResolution = p.txResolution;
}

void PnicImpl::SetPauseParams(const Net::PnicPauseParams& pause) {
    if (auto* nics = Real("SetPauseParams", name_)) return nics->SetPauseParams(name_, pause);
    const auto& nic = Enter("SetPauseParams", name_,
                            "autoneg=" + Lib::Args(pause.autoNegotiate) + " rx=" + Lib::Args(pause.rx) +
                                " tx=" + Lib::Args(pause.tx));
    if (!nic.pause.supported) throw HostCtlException(name_ + " does not support pause parameters");
    if (pause.autoNegotiate && !nic.settings.autoNegotiation) {
        throw HostCtlException("Pause auto-negotiation needs link auto-negotiation, which is off on " +
                               name_ + " (a speed and duplex are forced)");
    }
    auto& changed = Model::WritePnic(name_);
    changed.pause.autoNegotiate = pause.autoNegotiate;
    changed.pause.rx = pause.rx;
    changed.pause.tx = pause.tx;
    Model::ResolvePause(changed);
}

// ---------------------------------------------------------------- coalescing

void PnicImpl::GetCoalesceParams(Net::PnicCoalesceParams& params) const {
    if (auto* nics = Real("GetCoalesceParams", name_)) return nics->GetCoalesceParams(name_, params);
    const auto& nic = Enter("GetCoalesceParams", name_);
    Require(nic, "coalesce", "interrupt coalescing");
    const auto& c = nic.coalesce;
    params.adaptiveRx = c.adaptiveRx;
    params.adaptiveTx = c.adaptiveTx;
    params.sampleInterval = c.sampleInterval;
    params.pktRateLow = c.lowPacketRate;
    params.pktRateHigh = c.highPacketRate;
    params.rxUsecs = c.rxUsecs;
    params.rxMaxFrames = c.rxMaxFrames;
    params.txUsecs = c.txUsecs;
    params.txMaxFrames = c.txMaxFrames;
    params.rxUsecsLow = c.rxUsecsLow;
    params.rxMaxFramesLow = c.rxMaxFramesLow;
    params.txUsecsLow = c.txUsecsLow;
    params.txMaxFramesLow = c.txMaxFramesLow;
    params.rxUsecsHigh = c.rxUsecsHigh;
    params.rxMaxFramesHigh = c.rxMaxFramesHigh;
    params.txUsecsHigh = c.txUsecsHigh;
    params.txMaxFramesHigh = c.txMaxFramesHigh;
    params.rxUsecsIrq = c.rxUsecsIrq;
    params.rxMaxFramesIrq = c.rxMaxFramesIrq;
    params.txUsecsIrq = c.txUsecsIrq;
    params.txMaxFramesIrq = c.txMaxFramesIrq;
    params.statsBlockUsecs = c.statsBlockUsecs;
}

void PnicImpl::SetCoalesceParams(const Net::PnicCoalesceParams& p) {
    if (auto* nics = Real("SetCoalesceParams", name_)) return nics->SetCoalesceParams(name_, p);
    const auto& nic =
        Enter("SetCoalesceParams", name_,
              Lib::Args("rx=" + std::to_string(p.rxUsecs) + "/" + std::to_string(p.rxMaxFrames),
                        "tx=" + std::to_string(p.txUsecs) + "/" + std::to_string(p.txMaxFrames),
                        "adaptive=" + Lib::Args(p.adaptiveRx) + "/" + Lib::Args(p.adaptiveTx),
                        "interval=" + std::to_string(p.sampleInterval), "low=" + std::to_string(p.pktRateLow),
                        "high=" + std::to_string(p.pktRateHigh)));
    Require(nic, "coalesce", "interrupt coalescing");
    if (p.sampleInterval > 3600) {
        throw HostCtlException("Sample interval " + std::to_string(p.sampleInterval) +
                               " is out of range (1 to 3600 seconds)");
    }
    if ((p.adaptiveRx || p.adaptiveTx) && p.sampleInterval == 0)
        throw HostCtlException("Adaptive coalescing needs a sample interval of 1 to 3600 seconds");
    if (p.pktRateLow != 0 && p.pktRateHigh != 0 && p.pktRateLow >= p.pktRateHigh) {
        throw HostCtlException("The low packet rate (" + std::to_string(p.pktRateLow) +
                               " pps) must be below the high packet rate (" + std::to_string(p.pktRateHigh) +
                               " pps)");
    }
    auto& c = Model::WritePnic(name_).coalesce;
    c.adaptiveRx = p.adaptiveRx;
    c.adaptiveTx = p.adaptiveTx;
    c.sampleInterval = p.sampleInterval;
    c.lowPacketRate = p.pktRateLow;
    c.highPacketRate = p.pktRateHigh;
    c.rxUsecs = p.rxUsecs;
    c.rxMaxFrames = p.rxMaxFrames;
    c.txUsecs = p.txUsecs;
    c.txMaxFrames = p.txMaxFrames;
    c.rxUsecsLow = p.rxUsecsLow;
    c.rxMaxFramesLow = p.rxMaxFramesLow;
    c.txUsecsLow = p.txUsecsLow;
    c.txMaxFramesLow = p.txMaxFramesLow;
    c.rxUsecsHigh = p.rxUsecsHigh;
    c.rxMaxFramesHigh = p.rxMaxFramesHigh;
    c.txUsecsHigh = p.txUsecsHigh;
    c.txMaxFramesHigh = p.txMaxFramesHigh;
    c.rxUsecsIrq = p.rxUsecsIrq;
    c.rxMaxFramesIrq = p.rxMaxFramesIrq;
    c.txUsecsIrq = p.txUsecsIrq;
    c.txMaxFramesIrq = p.txMaxFramesIrq;
    c.statsBlockUsecs = p.statsBlockUsecs;
}

// ---------------------------------------------------------------- offloads

void PnicImpl::GetOffloadSettings(Net::PnicOffloadSettings& settings) const {
    if (auto* nics = Real("GetOffloadSettings", name_)) return nics->GetOffloadSettings(name_, settings);
    const auto& nic = Enter("GetOffloadSettings", name_);
    Require(nic, "offload", "offload settings");
    const auto& o = nic.offload;
    settings.rxChecksum = o.rxChecksum;
    settings.txChecksum = o.txChecksum;
    settings.scatterGather = o.scatterGather;
    settings.tso = o.tso;
    settings.gso = o.gso;
    settings.gro = o.gro;
    settings.lro = o.lro;
}

void PnicImpl::SetOffloadSettings(const Net::PnicOffloadSettings& s) {
    if (auto* nics = Real("SetOffloadSettings", name_)) return nics->SetOffloadSettings(name_, s);
    const auto& nic = Enter("SetOffloadSettings", name_,
                            Lib::Args("mask=" + Hex(s.mask), "rxcsum=" + Lib::Args(s.rxChecksum),
                                      "txcsum=" + Lib::Args(s.txChecksum), "sg=" + Lib::Args(s.scatterGather),
                                      "tso=" + Lib::Args(s.tso)));
    Require(nic, "offload", "offload settings");
    RequireMask(s.mask, 0x7f, "offload");
    auto& o = Model::WritePnic(name_).offload;
    if (s.mask & Net::PNIC_OFFLOAD_RX_CSUM) o.rxChecksum = s.rxChecksum;
    if (s.mask & Net::PNIC_OFFLOAD_TX_CSUM) o.txChecksum = s.txChecksum;
    if (s.mask & Net::PNIC_OFFLOAD_SG) o.scatterGather = s.scatterGather;
    if (s.mask & Net::PNIC_OFFLOAD_TSO) o.tso = s.tso;
    if (s.mask & Net::PNIC_OFFLOAD_GSO) o.gso = s.gso;
    if (s.mask & Net::PNIC_OFFLOAD_GRO) o.gro = s.gro;
    if (s.mask & Net::PNIC_OFFLOAD_LRO) o.lro = s.lro;
}

// ---------------------------------------------------------------- rings

void PnicImpl::GetRingParams(Net::PnicRingParams& params) const {
    if (auto* nics = Real("GetRingParams", name_)) return nics->GetRingParams(name_, params);
    const auto& nic = Enter("GetRingParams", name_);
    Require(nic, "ring", "ring parameters");
    const auto& r = nic.ring;
    params.rxMax = r.preset.rx;
    params.rxMiniMax = r.preset.rxMini;
    params.rxJumboMax = r.preset.rxJumbo;
    params.txMax = r.preset.tx;
    params.rx = r.current.rx;
    params.rxMini = r.current.rxMini;
    params.rxJumbo = r.current.rxJumbo;
    params.tx = r.current.tx;
}

void PnicImpl::SetRingParams(const Net::PnicRingParams& p) {
    if (auto* nics = Real("SetRingParams", name_)) return nics->SetRingParams(name_, p);
    std::string arguments = "mask=" + Hex(p.mask);
    if (p.mask & Net::PNIC_RING_RX) arguments += " rx=" + std::to_string(p.rx);
    if (p.mask & Net::PNIC_RING_RX_MINI) arguments += " rxMini=" + std::to_string(p.rxMini);
    if (p.mask & Net::PNIC_RING_RX_JUMBO) arguments += " rxJumbo=" + std::to_string(p.rxJumbo);
    if (p.mask & Net::PNIC_RING_TX) arguments += " tx=" + std::to_string(p.tx);
    const auto& nic = Enter("SetRingParams", name_, arguments);
    Require(nic, "ring", "ring parameters");
    RequireMask(p.mask, 0xf, "ring");
    struct Ring {
        std::uint8_t bit;
        const char* what;
        std::uint32_t requested;
        std::uint32_t maximum;
        bool mayBeZero;
    };
    const auto& preset = nic.ring.preset;
    const Ring rings[] = {{Net::PNIC_RING_RX, "RX", p.rx, preset.rx, false},
                          {Net::PNIC_RING_RX_MINI, "RX mini", p.rxMini, preset.rxMini, true},
                          {Net::PNIC_RING_RX_JUMBO, "RX jumbo", p.rxJumbo, preset.rxJumbo, true},
                          {Net::PNIC_RING_TX, "TX", p.tx, preset.tx, false}};
    for (const auto& ring : rings) {
        if (!(p.mask & ring.bit)) continue;
        if (ring.maximum == 0 && ring.requested != 0)
            throw HostCtlException(name_ + " has no " + ring.what + " ring");
        if (ring.requested > ring.maximum) {
            throw HostCtlException(std::string(ring.what) + " ring size " + std::to_string(ring.requested) +
                                   " exceeds the maximum of " + std::to_string(ring.maximum) + " on " +
                                   name_);
        }
        if (ring.requested == 0 && !ring.mayBeZero)
            throw HostCtlException(std::string(ring.what) + " ring size must be at least 1");
    }
    auto& current = Model::WritePnic(name_).ring.current;
    if (p.mask & Net::PNIC_RING_RX) current.rx = p.rx;
    if (p.mask & Net::PNIC_RING_RX_MINI) current.rxMini = p.rxMini;
    if (p.mask & Net::PNIC_RING_RX_JUMBO) current.rxJumbo = p.rxJumbo;
    if (p.mask & Net::PNIC_RING_TX) current.tx = p.tx;
}

// ---------------------------------------------------------------- software simulation

namespace {
// The record's switches in mask-bit order (bit i = 1 << i), as the model keeps them.
template <class Settings>
auto SoftwareSwitches(Settings& s) {
    return std::array{&s.ipv4Cso,       &s.ipv4Tso,      &s.sg,          &s.obo,
                      &s.vxlanEncap,    &s.ipv6Tso,      &s.ipv6TsoExt,  &s.ipv6Cso,
                      &s.ipv6CsoExt,    &s.highDma,      &s.sgSpanPages, &s.vlanTagging,
                      &s.vlanUntagging, &s.geneveOffload};
}
}  // namespace

void PnicImpl::GetSoftwareSettings(Net::PnicSoftwareSettings& settings) const {
    if (auto* nics = Real("GetSoftwareSettings", name_)) return nics->GetSoftwareSettings(name_, settings);
    const auto& nic = Enter("GetSoftwareSettings", name_);
    Require(nic, "software", "software simulation of offloads");
    auto switches = SoftwareSwitches(settings);
    for (std::size_t i = 0; i < Model::kSoftwareFeatureCount; ++i)
        *switches[i] = nic.software[i];
}

void PnicImpl::SetSoftwareSettings(const Net::PnicSoftwareSettings& settings) {
    if (auto* nics = Real("SetSoftwareSettings", name_)) return nics->SetSoftwareSettings(name_, settings);
    auto switches = SoftwareSwitches(settings);
    std::string arguments = "mask=" + Hex(settings.mask);
    for (std::size_t i = 0; i < Model::kSoftwareFeatureCount; ++i) {
        if (settings.mask & (1u << i))
            arguments += std::string(" ") + Model::kSoftwareFeatureNames[i] + "=" + Lib::Args(*switches[i]);
    }
    const auto& nic = Enter("SetSoftwareSettings", name_, arguments);
    Require(nic, "software", "software simulation of offloads");
    RequireMask(settings.mask, (1u << Model::kSoftwareFeatureCount) - 1, "software simulation");
    auto& software = Model::WritePnic(name_).software;
    for (std::size_t i = 0; i < Model::kSoftwareFeatureCount; ++i) {
        if (settings.mask & (1u << i)) software[i] = *switches[i];
    }
}

}  // namespace TknCtl::Network

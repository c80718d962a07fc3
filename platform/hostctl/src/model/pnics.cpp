#include "model/pnics.h"

#include <algorithm>

#include "hostctl/exception.h"

#include "model/values.h"
#include "model/worlds.h"

namespace TknCtl::Model {

const Pnic* PnicsSection::Find(const std::string& name) const {
    for (const auto& nic : nics) {
        if (nic.name == name) return &nic;
    }
    return nullptr;
}

Pnic* PnicsSection::Find(const std::string& name) {
    return const_cast<Pnic*>(static_cast<const PnicsSection*>(this)->Find(name));
}

const Pnic& ReadPnic(const std::string& name) {
    const auto* nic = Lib::Read<PnicsSection>().Find(name);
    if (!nic) throw HostCtl::Lib::HostCtlException("Physical NIC " + name + " does not exist");
    return *nic;
}

Pnic& WritePnic(const std::string& name) {
    ReadPnic(name);
    return *Lib::Write<PnicsSection>().Find(name);
}

void ResolvePause(Pnic& nic) {
    auto& pause = nic.pause;
    if (pause.supported && pause.autoNegotiate && nic.settings.autoNegotiation && nic.linkUp) {
        pause.rxResolution = pause.rx ? 1 : 2;
        pause.txResolution = pause.tx ? 1 : 2;
    } else {
        pause.rxResolution = 0;
        pause.txResolution = 0;
    }
}

void Renegotiate(Pnic& nic) {
    const LinkMode* best = nullptr;
    for (const auto& mode : nic.settings.advertisedModes) {
        if (mode.speed == 0) continue;
        if (!best || mode.speed > best->speed || (mode.speed == best->speed && mode.duplex == 1))
            best = &mode;
    }
    if (best) {
        nic.speed = best->speed;
        nic.duplex = best->duplex == 2 ? 2 : 1;
    }
    nic.linkUp = nic.adminUp && nic.carrier;
    ResolvePause(nic);
}

bool Supports(const Pnic& nic, const char* feature) {
    return std::find(nic.unsupported.begin(), nic.unsupported.end(), feature) == nic.unsupported.end();
}

namespace {

using Json::Field;
using Json::In;
using Json::Node;

const Field<PauseParams, bool> kPauseFlags[] = {{"supported", &PauseParams::supported},
                                                {"autoNegotiate", &PauseParams::autoNegotiate},
                                                {"rx", &PauseParams::rx},
                                                {"tx", &PauseParams::tx}};
const Field<PauseParams, std::uint32_t> kPauseCodes[] = {{"rxResolution", &PauseParams::rxResolution},
                                                         {"txResolution", &PauseParams::txResolution}};

const Field<CoalesceParams, bool> kCoalesceFlags[] = {{"adaptiveRx", &CoalesceParams::adaptiveRx},
                                                      {"adaptiveTx", &CoalesceParams::adaptiveTx}};
const Field<CoalesceParams, std::uint32_t> kCoalesceValues[] = {
    {"sampleInterval", &CoalesceParams::sampleInterval},
    {"lowPacketRate", &CoalesceParams::lowPacketRate},
    {"highPacketRate", &CoalesceParams::highPacketRate},
    {"rxUsecs", &CoalesceParams::rxUsecs},
    {"rxMaxFrames", &CoalesceParams::rxMaxFrames},
    {"txUsecs", &CoalesceParams::txUsecs},
    {"txMaxFrames", &CoalesceParams::txMaxFrames},
    {"rxUsecsLow", &CoalesceParams::rxUsecsLow},
    {"rxMaxFramesLow", &CoalesceParams::rxMaxFramesLow},
    {"txUsecsLow", &CoalesceParams::txUsecsLow},
    {"txMaxFramesLow", &CoalesceParams::txMaxFramesLow},
    {"rxUsecsHigh", &CoalesceParams::rxUsecsHigh},
    {"rxMaxFramesHigh", &CoalesceParams::rxMaxFramesHigh},
    {"txUsecsHigh", &CoalesceParams::txUsecsHigh},
    {"txMaxFramesHigh", &CoalesceParams::txMaxFramesHigh},
    {"rxUsecsIrq", &CoalesceParams::rxUsecsIrq},
    {"rxMaxFramesIrq", &CoalesceParams::rxMaxFramesIrq},
    {"txUsecsIrq", &CoalesceParams::txUsecsIrq},
    {"txMaxFramesIrq", &CoalesceParams::txMaxFramesIrq},
    {"statsBlockUsecs", &CoalesceParams::statsBlockUsecs}};

const Field<OffloadSettings, bool> kOffloadFlags[] = {{"rxChecksum", &OffloadSettings::rxChecksum},
                                                      {"txChecksum", &OffloadSettings::txChecksum},
                                                      {"scatterGather", &OffloadSettings::scatterGather},
                                                      {"tso", &OffloadSettings::tso},
                                                      {"gso", &OffloadSettings::gso},
                                                      {"gro", &OffloadSettings::gro},
                                                      {"lro", &OffloadSettings::lro}};

const Field<RingSizes, std::uint32_t> kRingSizes[] = {{"rx", &RingSizes::rx},
                                                      {"rxMini", &RingSizes::rxMini},
                                                      {"rxJumbo", &RingSizes::rxJumbo},
                                                      {"tx", &RingSizes::tx}};

const Field<PnicStats, std::uint64_t> kPnicStats[] = {{"rxPackets", &PnicStats::rxPackets},
                                                      {"txPackets", &PnicStats::txPackets},
                                                      {"rxBytes", &PnicStats::rxBytes},
                                                      {"txBytes", &PnicStats::txBytes},
                                                      {"rxDropped", &PnicStats::rxDropped},
                                                      {"txDropped", &PnicStats::txDropped},
                                                      {"rxMulticast", &PnicStats::rxMulticast},
                                                      {"rxBroadcast", &PnicStats::rxBroadcast},
                                                      {"txMulticast", &PnicStats::txMulticast},
                                                      {"txBroadcast", &PnicStats::txBroadcast},
                                                      {"rxErrors", &PnicStats::rxErrors},
                                                      {"rxLengthErrors", &PnicStats::rxLengthErrors},
                                                      {"rxOverErrors", &PnicStats::rxOverErrors},
                                                      {"rxCrcErrors", &PnicStats::rxCrcErrors},
                                                      {"rxFrameErrors", &PnicStats::rxFrameErrors},
                                                      {"rxFifoErrors", &PnicStats::rxFifoErrors},
                                                      {"rxMissedErrors", &PnicStats::rxMissedErrors},
                                                      {"txErrors", &PnicStats::txErrors},
                                                      {"txAbortedErrors", &PnicStats::txAbortedErrors},
                                                      {"txCarrierErrors", &PnicStats::txCarrierErrors},
                                                      {"txFifoErrors", &PnicStats::txFifoErrors},
                                                      {"txHeartbeatErrors", &PnicStats::txHeartbeatErrors},
                                                      {"txWindowErrors", &PnicStats::txWindowErrors}};

const Field<FilterClasses, bool> kFilterClasses[] = {
    {"macOnly", &FilterClasses::macOnly}, {"vlanOnly", &FilterClasses::vlanOnly},
    {"vlanMac", &FilterClasses::vlanMac}, {"vxlan", &FilterClasses::vxlan},
    {"geneve", &FilterClasses::geneve},   {"genericEncap", &FilterClasses::genericEncap}};

const Field<VfStats, std::uint64_t> kVfStats[] = {{"rxUnicastPkts", &VfStats::rxUnicastPkts},
                                                  {"rxUnicastBytes", &VfStats::rxUnicastBytes},
                                                  {"rxMulticastPkts", &VfStats::rxMulticastPkts},
                                                  {"rxMulticastBytes", &VfStats::rxMulticastBytes},
                                                  {"rxBroadcastPkts", &VfStats::rxBroadcastPkts},
                                                  {"rxBroadcastBytes", &VfStats::rxBroadcastBytes},
                                                  {"rxOutOfBufferDrops", &VfStats::rxOutOfBufferDrops},
                                                  {"rxErrorDrops", &VfStats::rxErrorDrops},
                                                  {"rxLroPkts", &VfStats::rxLroPkts},
                                                  {"rxLroBytes", &VfStats::rxLroBytes},
                                                  {"txUnicastPkts", &VfStats::txUnicastPkts},
                                                  {"txUnicastBytes", &VfStats::txUnicastBytes},
                                                  {"txMulticastPkts", &VfStats::txMulticastPkts},
                                                  {"txMulticastBytes", &VfStats::txMulticastBytes},
                                                  {"txBroadcastPkts", &VfStats::txBroadcastPkts},
                                                  {"txBroadcastBytes", &VfStats::txBroadcastBytes},
                                                  {"txErrors", &VfStats::txErrors},
                                                  {"txDiscards", &VfStats::txDiscards},
                                                  {"txTsoPkts", &VfStats::txTsoPkts},
                                                  {"txTsoBytes", &VfStats::txTsoBytes}};

template <class S, std::size_t A, std::size_t B>
void ReadMixed(const std::optional<In>& in, S& out, const Field<S, bool> (&flags)[A],
               const Field<S, std::uint32_t> (&values)[B]) {
    if (!in) return;
    Json::ReadFields(*in, out, flags);
    Json::ReadFields(*in, out, values);
    in->Done();
}

template <class S, class V, std::size_t N>
void ReadTable(const std::optional<In>& in, S& out, const Field<S, V> (&fields)[N]) {
    if (!in) return;
    Json::ReadFields(*in, out, fields);
    in->Done();
}

template <class S, std::size_t A, std::size_t B>
Node WriteMixed(const S& value, const Field<S, bool> (&flags)[A],
                const Field<S, std::uint32_t> (&values)[B]) {
    Node node = Json::WriteFields(value, flags);
    for (const auto& field : values)
        node[field.key] = value.*field.member;
    return node;
}

std::vector<std::uint32_t> Codes(const In& in, const char* key) {
    std::vector<std::uint32_t> codes;
    in.Each(key, [&](const In& element) { codes.push_back(element.Int<std::uint32_t>()); });
    return codes;
}

std::vector<LinkMode> Modes(const In& in, const char* key) {
    std::vector<LinkMode> modes;
    in.Each(key, [&](const In& item) {
        LinkMode mode;
        mode.speed = item.Int<std::uint32_t>("speed", 0);
        mode.duplex = item.Int<std::uint32_t>("duplex", 0);
        mode.media = item.Int<std::uint32_t>("media", 0);
        item.Done();
        modes.push_back(mode);
    });
    return modes;
}

PnicSettings LoadSettings(const In& in) {
    PnicSettings s;
    s.supportedPorts = Codes(in, "supportedPorts");
    s.supportsAutoNegotiation = in.Bool("supportsAutoNegotiation", s.supportsAutoNegotiation);
    s.advertisedModes = Modes(in, "advertisedModes");
    s.supportedModes = in.Has("supportedModes") ? Modes(in, "supportedModes") : s.advertisedModes;
    s.advertisedAutoNegotiation = in.Bool("advertisedAutoNegotiation", s.advertisedAutoNegotiation);
    s.port = in.Int<std::uint32_t>("port", 0);
    s.phyAddress = in.Int<std::uint32_t>("phyAddress", 0);
    s.transceiver = in.Int<std::uint32_t>("transceiver", 0);
    s.autoNegotiation = in.Bool("autoNegotiation", s.autoNegotiation);
    s.supportsWakeOn = in.Bool("supportsWakeOn", false);
    if (in.Has("supportedWakeOn")) {
        s.supportedWakeOn = Codes(in, "supportedWakeOn");
    } else if (s.supportsWakeOn) {
        s.supportedWakeOn = {0, 1, 2, 3, 4, 5, 6};
    }
    s.wakeOn = Codes(in, "wakeOn");
    s.supportsMessageLevel = in.Bool("supportsMessageLevel", s.supportsMessageLevel);
    s.messageLevel = in.Int<std::uint32_t>("messageLevel", 0);
    s.virtualAddress = in.Str("virtualAddress", "");
    in.Done();
    return s;
}

Node SaveModes(const std::vector<LinkMode>& modes) {
    Node out = Node::array();
    for (const auto& mode : modes)
        out.push_back({{"speed", mode.speed}, {"duplex", mode.duplex}, {"media", mode.media}});
    return out;
}

Node SaveSettings(const PnicSettings& s) {
    return Node{{"supportedPorts", s.supportedPorts},
                {"supportsAutoNegotiation", s.supportsAutoNegotiation},
                {"supportedModes", SaveModes(s.supportedModes)},
                {"advertisedModes", SaveModes(s.advertisedModes)},
                {"advertisedAutoNegotiation", s.advertisedAutoNegotiation},
                {"port", s.port},
                {"phyAddress", s.phyAddress},
                {"transceiver", s.transceiver},
                {"autoNegotiation", s.autoNegotiation},
                {"supportsWakeOn", s.supportsWakeOn},
                {"supportedWakeOn", s.supportedWakeOn},
                {"wakeOn", s.wakeOn},
                {"supportsMessageLevel", s.supportsMessageLevel},
                {"messageLevel", s.messageLevel},
                {"virtualAddress", s.virtualAddress}};
}

SelfTestResult LoadSelfTestResult(const std::optional<In>& in) {
    SelfTestResult result;
    if (!in) return result;
    result.failed = in->Bool("failed", false);
    result.info = in->Strings("info");
    in->Done();
    return result;
}

Node SaveSelfTestResult(const SelfTestResult& result) {
    return Node{{"failed", result.failed}, {"info", result.info}};
}

Netqueue LoadNetqueue(const In& in) {
    Netqueue q;
    q.balancerEnabled = in.Bool("balancerEnabled", q.balancerEnabled);
    if (auto features = in.OptMember("features")) {
        for (std::size_t i = 0; i < kLbFeatureCount; ++i) {
            if (auto feature = features->OptMember(kLbFeatureNames[i])) {
                q.features[i].supported = feature->Bool("supported", false);
                q.features[i].allowed = feature->Bool("allowed", false);
                feature->Done();
            }
        }
        features->Done();
    }
    ReadTable(in.OptMember("filterClasses"), q.filterClasses, kFilterClasses);
    q.txQueues = in.Int<std::uint32_t>("txQueues", 0);
    q.rxQueues = in.Int<std::uint32_t>("rxQueues", 0);
    q.maxTxQueues = in.Int<std::uint32_t>("maxTxQueues", 0);
    q.maxRxQueues = in.Int<std::uint32_t>("maxRxQueues", 0);
    in.Each("plugins", [&](const In& item) {
        NetqueuePlugin plugin;
        plugin.module = item.Str("module");
        plugin.plugin = item.Str("plugin");
        plugin.description = item.Str("description", "");
        plugin.enabled = item.Bool("enabled", false);
        item.Done();
        q.plugins.push_back(std::move(plugin));
    });
    in.Done();
    return q;
}

Node SaveNetqueue(const Netqueue& q) {
    Node features = Node::object();
    for (std::size_t i = 0; i < kLbFeatureCount; ++i) {
        features[kLbFeatureNames[i]] = {{"supported", q.features[i].supported},
                                        {"allowed", q.features[i].allowed}};
    }
    Node plugins = Node::array();
    for (const auto& p : q.plugins) {
        plugins.push_back({{"module", p.module},
                           {"plugin", p.plugin},
                           {"description", p.description},
                           {"enabled", p.enabled}});
    }
    return Node{{"balancerEnabled", q.balancerEnabled},
                {"features", std::move(features)},
                {"filterClasses", Json::WriteFields(q.filterClasses, kFilterClasses)},
                {"txQueues", q.txQueues},
                {"rxQueues", q.rxQueues},
                {"maxTxQueues", q.maxTxQueues},
                {"maxRxQueues", q.maxRxQueues},
                {"plugins", std::move(plugins)}};
}

Sriov LoadSriov(const In& in) {
    Sriov s;
    s.enabled = in.Bool("enabled", false);
    s.maxVfs = in.Int<std::uint32_t>("maxVfs", 0);
    in.Each("vfs", [&](const In& item) {
        VirtualFunction vf;
        vf.id = item.Int<std::uint8_t>("id");
        vf.active = item.Bool("active", false);
        vf.pciAddress = item.Str("pciAddress", "");
        vf.ownerWorldId = item.Int<std::uint32_t>("ownerWorldId", 0);
        ReadTable(item.OptMember("stats"), vf.stats, kVfStats);
        item.Done();
        s.vfs.push_back(std::move(vf));
    });
    in.Done();
    return s;
}

Node SaveSriov(const Sriov& s) {
    Node vfs = Node::array();
    for (const auto& vf : s.vfs) {
        vfs.push_back({{"id", vf.id},
                       {"active", vf.active},
                       {"pciAddress", vf.pciAddress},
                       {"ownerWorldId", vf.ownerWorldId},
                       {"stats", Json::WriteFields(vf.stats, kVfStats)}});
    }
    return Node{{"enabled", s.enabled}, {"maxVfs", s.maxVfs}, {"vfs", std::move(vfs)}};
}

Pnic LoadPnic(const In& in) {
    Pnic nic;
    nic.name = in.Str("name");
    if (auto pci = in.OptMember("pci")) {
        nic.pci = PciDevice{pci->Str("address"), pci->Str("vendor", ""), pci->Str("device", "")};
        pci->Done();
    }
    nic.description = in.Str("description", "");
    if (auto driver = in.OptMember("driver")) {
        nic.driver.name = driver->Str("name", "");
        nic.driver.version = driver->Str("version", "");
        nic.driver.firmwareVersion = driver->Str("firmwareVersion", "");
        nic.driver.busInfo = driver->Str("busInfo", "");
        driver->Done();
    }
    nic.adminUp = in.Bool("adminUp", true);
    nic.linkUp = in.Bool("linkUp", true);
    nic.carrier = in.Bool("carrier", nic.linkUp);
    nic.speed = in.Int<std::uint32_t>("speed", 0);
    nic.duplex = in.Int<std::uint32_t>("duplex", 1);
    nic.mtu = in.Int<std::uint32_t>("mtu", 1500);
    if (auto mac = in.OptMember("mac")) nic.mac = ReadMac(*mac);
    if (auto settings = in.OptMember("settings")) nic.settings = LoadSettings(*settings);
    ReadMixed(in.OptMember("pause"), nic.pause, kPauseFlags, kPauseCodes);
    ReadMixed(in.OptMember("coalesce"), nic.coalesce, kCoalesceFlags, kCoalesceValues);
    if (auto offload = in.OptMember("offload")) {
        Json::ReadFields(*offload, nic.offload, kOffloadFlags);
        offload->Done();
    }
    if (auto ring = in.OptMember("ring")) {
        ReadTable(ring->OptMember("preset"), nic.ring.preset, kRingSizes);
        ReadTable(ring->OptMember("current"), nic.ring.current, kRingSizes);
        ring->Done();
    }
    if (auto software = in.OptMember("software")) {
        for (std::size_t i = 0; i < kSoftwareFeatureCount; ++i) {
            nic.software[i] = software->Bool(kSoftwareFeatureNames[i], false);
        }
        software->Done();
    }
    ReadTable(in.OptMember("stats"), nic.stats, kPnicStats);
    nic.vlanStatsEnabled = in.Bool("vlanStatsEnabled", false);
    in.Each("vlanStats", [&](const In& item) {
        VlanStats entry;
        entry.vlanId = item.Int<std::uint32_t>("vlanId");
        entry.rxPackets = item.Int<std::uint64_t>("rxPackets", 0);
        entry.txPackets = item.Int<std::uint64_t>("txPackets", 0);
        item.Done();
        nic.vlanStats.push_back(entry);
    });
    if (auto eeprom = in.OptMember("eeprom")) {
        nic.eeprom.magic = eeprom->Int<std::uint32_t>("magic", 0);
        if (auto data = eeprom->OptMember("data")) nic.eeprom.data = Json::HexBytes(*data);
        eeprom->Done();
    }
    if (auto registers = in.OptMember("registers")) nic.registers = Json::HexBytes(*registers);
    if (auto selfTest = in.OptMember("selfTest")) {
        nic.selfTest.online = LoadSelfTestResult(selfTest->OptMember("online"));
        nic.selfTest.offline = LoadSelfTestResult(selfTest->OptMember("offline"));
        selfTest->Done();
    }
    if (auto netqueue = in.OptMember("netqueue")) nic.netqueue = LoadNetqueue(*netqueue);
    if (auto sriov = in.OptMember("sriov")) nic.sriov = LoadSriov(*sriov);
    nic.unsupported = in.Strings("unsupported");
    in.Done();
    return nic;
}

Node SavePnic(const Pnic& nic) {
    Node node = {{"name", nic.name}};
    if (nic.pci) {
        node["pci"] = {
            {"address", nic.pci->address}, {"vendor", nic.pci->vendor}, {"device", nic.pci->device}};
    }
    if (!nic.description.empty()) node["description"] = nic.description;
    node["driver"] = {{"name", nic.driver.name},
                      {"version", nic.driver.version},
                      {"firmwareVersion", nic.driver.firmwareVersion},
                      {"busInfo", nic.driver.busInfo}};
    node["adminUp"] = nic.adminUp;
    node["carrier"] = nic.carrier;
    node["linkUp"] = nic.linkUp;
    node["speed"] = nic.speed;
    node["duplex"] = nic.duplex;
    node["mtu"] = nic.mtu;
    node["mac"] = nic.mac.GetStringAddress();
    node["settings"] = SaveSettings(nic.settings);
    node["pause"] = WriteMixed(nic.pause, kPauseFlags, kPauseCodes);
    node["coalesce"] = WriteMixed(nic.coalesce, kCoalesceFlags, kCoalesceValues);
    node["offload"] = Json::WriteFields(nic.offload, kOffloadFlags);
    node["ring"] = {{"preset", Json::WriteFields(nic.ring.preset, kRingSizes)},
                    {"current", Json::WriteFields(nic.ring.current, kRingSizes)}};
    Node software = Node::object();
    for (std::size_t i = 0; i < kSoftwareFeatureCount; ++i)
        software[kSoftwareFeatureNames[i]] = nic.software[i];
    node["software"] = std::move(software);
    node["stats"] = Json::WriteFields(nic.stats, kPnicStats);
    node["vlanStatsEnabled"] = nic.vlanStatsEnabled;
    Node vlans = Node::array();
    for (const auto& v : nic.vlanStats) {
        vlans.push_back({{"vlanId", v.vlanId}, {"rxPackets", v.rxPackets}, {"txPackets", v.txPackets}});
    }
    node["vlanStats"] = std::move(vlans);
    node["eeprom"] = {{"magic", nic.eeprom.magic}, {"data", Json::HexText(nic.eeprom.data)}};
    node["registers"] = Json::HexText(nic.registers);
    node["selfTest"] = {{"online", SaveSelfTestResult(nic.selfTest.online)},
                        {"offline", SaveSelfTestResult(nic.selfTest.offline)}};
    node["netqueue"] = SaveNetqueue(nic.netqueue);
    node["sriov"] = SaveSriov(nic.sriov);
    if (!nic.unsupported.empty()) node["unsupported"] = nic.unsupported;
    return node;
}

void Load(const In& in, PnicsSection& section) {
    in.Elements([&](const In& item) { section.nics.push_back(LoadPnic(item)); });
}

Node Save(const PnicsSection& section) {
    Node out = Node::array();
    for (const auto& nic : section.nics)
        out.push_back(SavePnic(nic));
    return out;
}

void Check(const PnicsSection& section, Lib::Checker& checker) {
    RequireUnique(
        section.nics, [](const Pnic& n) { return n.name; }, checker, "NIC name");
    for (const auto& nic : section.nics) {
        RequireName(nic.name, checker, "NIC name");
        std::string where = "NIC " + Lib::Quote(nic.name) + ": ";
        if (nic.pci && nic.pci->address.empty()) checker.Fail(where + "empty PCI address");
        for (const auto& feature : nic.unsupported) {
            if (std::find_if(std::begin(kPnicFeatureNames), std::end(kPnicFeatureNames),
                             [&](const char* name) { return feature == name; }) ==
                std::end(kPnicFeatureNames)) {
                checker.Fail(where + "unknown feature " + Lib::Quote(feature) + " in \"unsupported\"");
            }
        }
        if (nic.linkUp && !(nic.adminUp && nic.carrier))
            checker.Fail(where + "link up while the adapter is down or has no carrier");
        for (auto code : nic.settings.supportedWakeOn) {
            if (code > 6)
                checker.Fail(where + "Wake-on mode " + std::to_string(code) + " cannot be supported");
        }
        const auto& ring = nic.ring;
        if (ring.current.rx > ring.preset.rx || ring.current.rxMini > ring.preset.rxMini ||
            ring.current.rxJumbo > ring.preset.rxJumbo || ring.current.tx > ring.preset.tx) {
            checker.Fail(where + "a current ring size exceeds its preset maximum");
        }
        RequireUnique(
            nic.sriov.vfs, [](const VirtualFunction& vf) { return std::to_string(vf.id); }, checker, "VF ID");
        RequireUnique(
            nic.netqueue.plugins, [](const NetqueuePlugin& p) { return p.module + "/" + p.plugin; }, checker,
            "netqueue plugin");
        if (nic.sriov.vfs.size() > nic.sriov.maxVfs)
            checker.Fail(where + "more VFs than the adapter offers (" + std::to_string(nic.sriov.maxVfs) +
                         ")");
        const auto& q = nic.netqueue;
        if ((q.maxTxQueues != 0 && q.txQueues > q.maxTxQueues) ||
            (q.maxRxQueues != 0 && q.rxQueues > q.maxRxQueues))
            checker.Fail(where + "more netqueues than the adapter offers");
        for (const auto& vf : nic.sriov.vfs) {
            if (vf.ownerWorldId != 0 && !checker.Get<WorldsSection>().Find(vf.ownerWorldId)) {
                checker.Fail(where + "VF " + std::to_string(vf.id) + " is owned by unknown world " +
                             std::to_string(vf.ownerWorldId));
            }
        }
    }
}

}  // namespace

const Lib::SectionKind& PnicsSection::Kind() {
    static const Json::JsonSection<PnicsSection> kind("pnics", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model

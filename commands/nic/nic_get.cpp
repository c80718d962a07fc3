#include <iterator>

#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicGet::NicGet() {
    Frame::Describe(*this, {"Get the generic configuration of a network device", "fetcher", "simple"});
}

InputSpecPtr NicGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"nic-name", "n", Frame::kString,
          "The name of the NIC to configured. This must be one of the cards listed in the nic list command.",
          Frame::kRequired}});
}

OutputSpecPtr NicGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr NicGet::GetOutputStructure() {
    auto driverInfo = Frame::MakeRecord(
        "NICDriverInfo", {Frame::StringField("Driver"), Frame::StringField("Version"),
                          Frame::StringField("Firmware Version"), Frame::StringField("Bus Info")});
    return Frame::MakeRecord("NICInfo", {Frame::StringField("Name"),
                                         Frame::StringListField("Supported Ports"),
                                         Frame::BoolField("Supports Auto Negotiation"),
                                         Frame::StringListField("Advertised Link Modes"),
                                         Frame::BoolField("Advertised Auto Negotiation"),
                                         Frame::StringField("Cable Type"),
                                         Frame::IntField("PHY Address"),
                                         Frame::StringField("Virtual Address"),
                                         Frame::StringField("Transceiver"),
                                         Frame::BoolField("Auto Negotiation"),
                                         Frame::BoolField("Supports Wakeon"),
                                         Frame::StringListField("Wakeon"),
                                         Frame::IntField("Current Message Level"),
                                         Frame::BoolField("Link Detected"),
                                         Frame::BoolField("Supports Pause"),
                                         Frame::BoolField("Pause Autonegotiate"),
                                         Frame::BoolField("Pause RX"),
                                         Frame::BoolField("Pause TX"),
                                         Frame::StringField("Link Status"),
                                         Frame::RecordField("Driver Info", driverInfo)});
}

namespace {

const char* SupportedPortText(std::uint32_t port) {
    static const char* const kNames[] = {"TP", "AUI", "BNC", "MII", "FIBRE", "DA"};
    return port < std::size(kNames) ? kNames[port] : "UNKNOWN";
}

const char* CableTypeText(std::uint32_t port) {
    static const char* const kNames[] = {"Twisted Pair", "AUI", "BNC", "MII", "FIBRE", "DA"};
    return port < std::size(kNames) ? kNames[port] : "";
}

const char* TransceiverText(std::uint32_t transceiver) {
    return transceiver == 0 ? "internal" : transceiver == 1 ? "external" : "";
}

const char* MediaText(std::uint32_t media) {
    static const char* const kNames[] = {
        "None",    "Unknown", "BaseT",     "BaseX",   "BaseKX",     "BaseSX",         "BaseLX",
        "BaseKR",  "BaseLR",  "BaseSR",    "BaseER",  "BaseTwinax", "BaseTwinaxLong", "BaseLRM",
        "BaseCR1", "BaseKR2", "BaseMLD2",  "BaseKR4", "BaseKX4",    "BaseCR4",        "BaseSR4",
        "BaseLR4", "BaseR4",  "BaseSGMII", "BaseSFI", "XLPPI",      "BaseCX-SGMII"};
    static_assert(std::size(kNames) == 27);
    return media < std::size(kNames) ? kNames[media] : "Unknown";
}

const char* LinkModeDuplexText(std::uint32_t duplex) {
    return duplex == 1 ? "Full" : duplex == 2 ? "Half" : duplex == 0 ? "Auto" : "";
}

std::string LinkModeText(const HostCtl::Network::PnicLinkMode& mode) {
    if (mode.speed == 0) return "Auto";
    return std::to_string(mode.speed) + MediaText(mode.media) + "/" + LinkModeDuplexText(mode.duplex);
}

std::string WakeOnText(HostCtl::Network::WakeOnMode mode) {
    switch (mode) {
        case HostCtl::Network::WAKE_ON_PHY:
            return "PHY Activity";
        case HostCtl::Network::WAKE_ON_UNICAST:
            return "Unicast Messagess";
        case HostCtl::Network::WAKE_ON_MULTICAST:
            return "Multicast Messages";
        case HostCtl::Network::WAKE_ON_BROADCAST:
            return "Broadcast Messages";
        case HostCtl::Network::WAKE_ON_ARP:
            return "ARP";
        case HostCtl::Network::WAKE_ON_MAGIC:
            return "MagicPacket(tm)";
        case HostCtl::Network::WAKE_ON_SECURE_ON:
            return "Enable SecureOn(tm) Password for" + std::string(28, ' ') + "MagicPacket(tm)";
        case HostCtl::Network::WAKE_ON_UNSUPPORTED:
            return "Unsupported";
        case HostCtl::Network::WAKE_ON_DISABLED:
            return "Disabled";
    }
    return "None";
}

}  // namespace

void NicGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("nic-name");
    Frame::HostCall(output, [&] {
        TknCtl::Network::NetworkInfoImpl info;
        auto pnic = info.GetPnicByName(name);
        if (!pnic) Frame::Fail("There is no pnic with name " + name);
        HostCtl::Network::PnicInfo settings;
        HostCtl::Network::PnicPauseParams pause;
        HostCtl::Network::PnicDriverInfo driver;
        pnic->GetPnicInfo(settings);
        pnic->GetPauseParams(pause);
        pnic->GetDriverInfo(driver);

        auto record = GetOutputStructure();
        record->SetField("Name", name);
        std::vector<std::string> ports;
        for (auto port : settings.supportedPorts)
            ports.push_back(SupportedPortText(port));
        record->SetField("Supported Ports", ports);
        record->SetField("Supports Auto Negotiation", settings.supportsAutoNegotiation);
        std::vector<std::string> modes;
        for (const auto& mode : settings.advertisedLinkModes)
            modes.push_back(LinkModeText(mode));
        record->SetField("Advertised Link Modes", modes);
        record->SetField("Advertised Auto Negotiation", settings.advertisedAutoNegotiation);
        record->SetField("Cable Type", CableTypeText(settings.port));
        record->SetField("PHY Address", static_cast<long>(settings.phyAddress));
        record->SetField("Virtual Address", settings.virtualAddress);
        record->SetField("Transceiver", TransceiverText(settings.transceiver));
        record->SetField("Auto Negotiation", settings.autoNegotiation);
        std::vector<std::string> wakeOn;
        if (settings.supportsWakeOn) {
            for (auto mode : settings.wakeOn)
                wakeOn.push_back(WakeOnText(mode));
        } else {
            wakeOn.push_back("None");
        }
        record->SetField("Supports Wakeon", settings.supportsWakeOn);
        record->SetField("Wakeon", wakeOn);
        record->SetField("Current Message Level",
                         settings.messageLevelSupported ? static_cast<long>(settings.messageLevel) : -1L);
        record->SetField("Link Detected", pnic->IsLinkUp());
        record->SetField("Supports Pause", pause.supported);
        if (pause.supported) {
            record->SetField("Pause Autonegotiate", pause.autoNegotiate);
            record->SetField("Pause RX", pause.rx);
            record->SetField("Pause TX", pause.tx);
        }
        record->SetField("Link Status", settings.linkStatus);
        auto driverInfo =
            std::static_pointer_cast<Zorbel::MetaObj::MetaStruct>(record->GetField("Driver Info"));
        driverInfo->SetField("Driver", driver.driver);
        driverInfo->SetField("Version", driver.version);
        driverInfo->SetField("Firmware Version", driver.firmwareVersion);
        driverInfo->SetField("Bus Info", driver.busInfo);
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace

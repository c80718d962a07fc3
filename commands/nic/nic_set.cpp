#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicSet::NicSet() {
    Frame::Describe(*this, {"Set the general options for the specified ethernet device.", "operation"});
}

InputSpecPtr NicSet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"nic-name", "n", Frame::kString,
         "The name of the NIC to configured. This must be one of the cards listed in the nic list command.",
         Frame::kRequired},
        {"port", "p", Frame::kString, "Selects device port. Available device ports are %FULLENUM%",
         Frame::kOptional,
         Frame::StringEnum({{"tp", "Select TP (Twisted Pair) as the device port"},
                            {"aui", "Select AUI (Attachment Unit Interface) as the device port"},
                            {"bnc", "Select BNC (Bayonet Neill-Concelman) as the device port"},
                            {"mii", "Select MII (Media Independent Interface) as the device port"},
                            {"fibre", "Select fibre as the device port"},
                            {"da", "Select DA (Direct Attach copper) as the device port"}})},
        {"phy-address", "P", Frame::kInt, "Set the PHY address of the device"},
        {"virtual-address", "V", Frame::kString, "Set the virtual address of the device"},
        {"transceiver-type", "t", Frame::kString,
         "Selects transeiver type. Currently only internal and external can be specified, in the future "
         "future "
         "types might be added. Available transeiver types are %FULLENUM%",
         Frame::kOptional,
         Frame::StringEnum({{"internal", "Set the transceiver type to internal"},
                            {"external", "Set the transceiver type to external"}})},
        {"wake-on-lan", "w", Frame::kString,
         "Sets Wake-on-LAN options. Not all devices support this. The argument to this option is a string of "
         "characters specifying which options to enable. \n"
         "p Wake on phy activity\n"
         "u Wake on unicast messages\n"
         "m Wake on multicast messages\n"
         "b Wake on broadcast messages\n"
         "a Wake on ARP\n"
         "g Wake on MagicPacket(tm)\n"
         "s Enable SecureOn(tm) password for MagicPacket(tm)\n",
         Frame::kOptional, Frame::Regex("[pumbagsd]+")},
        {"message-level", "l", Frame::kInt, "Sets the driver message level. Meaning differ per driver."},
        {"speed", "S", Frame::kInt, "The speed to set this NIC to, in Mbps. Acceptable values are :%ENUM%",
         Frame::kOptional,
         Frame::IntEnum({10, 100, 1000, 2500, 5000, 10000, 20000, 25000, 40000, 50000, 56000, 100000})},
        {"duplex", "D", Frame::kString, "The duplex to set this NIC to. Acceptable values are :%ENUM%",
         Frame::kOptional,
         Frame::StringEnum(
             {{"full", "Set this nic to full duplex"}, {"half", "Set this nic to half duplex"}})},
        {"auto", "a", Frame::kFlag, "Set the speed and duplexity settings to autonegotiate."},
    });
}

OutputSpecPtr NicSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

namespace {

std::uint32_t PortCode(const std::string& port) {
    static const char* const kPorts[] = {"tp", "aui", "bnc", "mii", "fibre", "da"};
    for (std::uint32_t code = 0; code < std::size(kPorts); ++code) {
        if (port == kPorts[code]) return code;
    }
    return HostCtl::Network::PNIC_PORT_TP;  // the enumeration admits nothing else
}

// Merges the parameters into the adapter's settings, marking what changes; true when
// anything changed. Fails (Frame::Fail) on a value the adapter cannot take.
bool MergeSettings(const Zorbel::CallSpec::Input& input, HostCtl::Network::PnicInfo& info) {
    bool changed = false;
    if (input.HasParameter("port")) {
        const std::uint32_t port = PortCode(input.GetParameter("port"));
        if (port != info.port) {
            info.port = port;
            info.portChanged = true;
            changed = true;
        }
    }
    if (input.HasParameter("phy-address")) {
        const std::int64_t address = input.GetParameterInt("phy-address");
        if (address >= 1) {
            if (address != info.phyAddress) {
                info.phyAddress = address;
                info.phyAddressChanged = true;
                changed = true;
            }
        } else if (address != -1) {
            Frame::Fail("Invalid PHY address value.");
        }
    }
    if (input.HasParameter("virtual-address")) {
        const std::string& address = input.GetParameter("virtual-address");
        if (address != info.virtualAddress) {
            info.virtualAddress = address;
            info.virtualAddressChanged = true;
            changed = true;
        }
    }
    if (input.HasParameter("transceiver-type")) {
        const std::uint32_t transceiver = input.GetParameter("transceiver-type") == "external"
                                              ? HostCtl::Network::PNIC_TRANSCEIVER_EXTERNAL
                                              : HostCtl::Network::PNIC_TRANSCEIVER_INTERNAL;
        if (transceiver != info.transceiver) {
            info.transceiver = transceiver;
            info.transceiverChanged = true;
            changed = true;
        }
    }
    if (input.HasParameter("wake-on-lan")) {
        if (!info.supportsWakeOn) Frame::Fail("Not Support wol.");
        info.wakeOnChanged = true;
        info.wakeOn.clear();
        for (char letter : input.GetParameter("wake-on-lan")) {
            switch (letter) {
                case 'a':
                    info.wakeOn.push_back(HostCtl::Network::WAKE_ON_ARP);
                    break;
                case 'b':
                    info.wakeOn.push_back(HostCtl::Network::WAKE_ON_BROADCAST);
                    break;
                case 'g':
                    info.wakeOn.push_back(HostCtl::Network::WAKE_ON_MAGIC);
                    break;
                case 'm':
                    info.wakeOn.push_back(HostCtl::Network::WAKE_ON_MULTICAST);
                    break;
                case 'p':
                    info.wakeOn.push_back(HostCtl::Network::WAKE_ON_PHY);
                    break;
                case 's':
                    info.wakeOn.push_back(HostCtl::Network::WAKE_ON_SECURE_ON);
                    break;
                case 'u':
                    info.wakeOn.push_back(HostCtl::Network::WAKE_ON_UNICAST);
                    break;
                default:
                    Frame::Fail("Invalid wol value.");
            }
        }
        changed = true;
    }
    if (input.HasParameter("message-level")) {
        if (!info.messageLevelSupported) Frame::Fail("Not Support msglvl.");
        const std::int64_t level = input.GetParameterInt("message-level");
        if (level != info.messageLevel) {
            info.messageLevel = level;
            info.messageLevelChanged = true;
            changed = true;
        }
    }
    return changed;
}

}  // namespace

void NicSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("nic-name");
    const bool hasSpeed = input->HasParameter("speed");
    const bool hasDuplex = input->HasParameter("duplex");
    const bool autoNegotiate = input->IsFlagSet("auto");
    if (hasSpeed != hasDuplex) {
        output->AddErrorMessage("The --speed and --duplex options must be specified together");
        return;
    }
    if (autoNegotiate && hasSpeed && hasDuplex) {
        output->AddErrorMessage(
            "The options --speed and --duplex cannot be specified with the --auto option.");
        return;
    }
    const bool linkChange = autoNegotiate || (hasSpeed && hasDuplex);
    Frame::HostCall(output, [&] {
        TknCtl::Network::NetworkInfoImpl info;
        auto pnic = info.GetPnicByName(name);
        if (!pnic) Frame::Fail("There is no pnic with name " + name);
        HostCtl::Network::PnicInfo settings;
        pnic->GetPnicInfo(settings);
        if (MergeSettings(*input, settings)) {
            pnic->SetPnicInfo(settings);
        } else if (!linkChange) {
            Frame::Fail("There is no change for nic " + name);
        }
        if (hasSpeed && hasDuplex) {
            const auto speed = static_cast<std::uint32_t>(input->GetParameterInt("speed"));
            pnic->SetSpeedDuplex(speed, input->GetParameter("duplex") == "full"
                                            ? HostCtl::Network::PNIC_DUPLEX_FULL
                                            : HostCtl::Network::PNIC_DUPLEX_HALF);
        } else if (autoNegotiate) {
            pnic->SetSpeedDuplex(0, 0);
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

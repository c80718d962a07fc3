// Counters and diagnostics of the Linux host's NICs: packet counters, register and EEPROM
// images, EEPROM writes, self tests and the restart of auto-negotiation.
#include <linux/ethtool.h>
#include <linux/ethtool_netlink.h>

#include <cerrno>

#include "hostctl/exception.h"
#include "network/pnic.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;
namespace Net = HostCtl::Network;

// ---------------------------------------------------------------- counters

// The kernel's counters of the device (what ip -s link shows). It counts received multicast
// but neither broadcast frames nor sent multicast: those come from the driver's IEEE 802.3
// MAC counters where it keeps them (ethtool's standard statistics), else they are 0.
void LinuxNics::GetStats(const std::string& name, Net::PnicStats& stats) {
    const auto link = Require(name);
    const auto& s = link.stats;
    stats = Net::PnicStats();
    stats.rxPackets = s.rxPackets;
    stats.txPackets = s.txPackets;
    stats.rxBytes = s.rxBytes;
    stats.txBytes = s.txBytes;
    stats.rxDropped = s.rxDropped;
    stats.txDropped = s.txDropped;
    stats.rxMulticast = s.multicast;
    stats.rxErrors = s.rxErrors;
    stats.rxLengthErrors = s.rxLengthErrors;
    stats.rxOverErrors = s.rxOverErrors;
    stats.rxCrcErrors = s.rxCrcErrors;
    stats.rxFrameErrors = s.rxFrameErrors;
    stats.rxFifoErrors = s.rxFifoErrors;
    stats.rxMissedErrors = s.rxMissedErrors;
    stats.txErrors = s.txErrors;
    stats.txAbortedErrors = s.txAbortedErrors;
    stats.txCarrierErrors = s.txCarrierErrors;
    stats.txFifoErrors = s.txFifoErrors;
    stats.txHeartbeatErrors = s.txHeartbeatErrors;
    stats.txWindowErrors = s.txWindowErrors;
    std::optional<Kernel::EthtoolReply> reply;
    try {
        reply = Ethtool().Send(Kernel::BuildStatsGet(Ethtool().Family(), name, {ETHTOOL_STATS_ETH_MAC}));
    } catch (const Kernel::EthtoolRefusal&) {
        return;  // a kernel or driver without standard statistics: the counters above are all
    }
    if (!reply) return;
    for (const auto& group : reply->statsGroups) {
        if (group.id != ETHTOOL_STATS_ETH_MAC) continue;
        auto counter = [&](int attribute) {
            auto it = group.counters.find(attribute);
            return it == group.counters.end() ? std::uint64_t{0} : it->second;
        };
        stats.rxBroadcast = counter(ETHTOOL_A_STATS_ETH_MAC_22_RX_BCAST);
        stats.txMulticast = counter(ETHTOOL_A_STATS_ETH_MAC_18_TX_MCAST);
        stats.txBroadcast = counter(ETHTOOL_A_STATS_ETH_MAC_19_TX_BCAST);
    }
}

// ---------------------------------------------------------------- registers and EEPROM

void LinuxNics::GetRegisterDump(const std::string& name, std::vector<std::uint8_t>& bytes) {
    Require(name);
    try {
        bytes = Kernel::ReadRegisters(name, Kernel::ReadDriverInfo(name).registersLength);
    } catch (const Kernel::EthtoolRefusal& refusal) {
        Refuse("Cannot dump the registers of " + name, refusal);
    }
}

namespace {

std::string EepromOf(const std::string& name, std::uint32_t size) {
    return "the EEPROM of " + name + " (" + std::to_string(size) + " bytes)";
}

}  // namespace

void LinuxNics::GetEepromDump(const std::string& name, std::vector<std::uint8_t>& bytes, std::int64_t length,
                              std::int64_t offset) {
    Require(name);
    try {
        const std::uint32_t size = Kernel::ReadDriverInfo(name).eepromLength;
        if (size == 0) {
            // A driver without an EEPROM says so itself when asked for one.
            Kernel::ReadEeprom(name, 0, 0);
            throw HostCtlException(name + " has no EEPROM (its driver reports a size of 0 bytes)");
        }
        if (offset < 0 || offset >= static_cast<std::int64_t>(size))
            throw HostCtlException("Offset " + std::to_string(offset) + " is outside " +
                                   EepromOf(name, size));
        if (length < 0) throw HostCtlException("Invalid EEPROM length " + std::to_string(length));
        const auto available = static_cast<std::int64_t>(size) - offset;
        const auto count = length == 0 ? available : std::min(available, length);
        bytes =
            Kernel::ReadEeprom(name, static_cast<std::uint32_t>(offset), static_cast<std::uint32_t>(count));
    } catch (const Kernel::EthtoolRefusal& refusal) {
        Refuse("Cannot dump the EEPROM of " + name, refusal);
    }
}

std::uint32_t LinuxNics::BeginEepromWrite(const std::string& name, std::int64_t magic) {
    Require(name);
    if (magic < 0 || magic > 0xffffffffLL)
        throw HostCtlException("Magic key " + std::to_string(magic) + " does not fit in 32 bits");
    context_.RequireUndoable("the EEPROM of a NIC");
    context_.BeginChange();
    try {
        const std::uint32_t size = Kernel::ReadDriverInfo(name).eepromLength;
        if (size == 0) {
            // The driver's own refusal says more; a dry run writes nothing, not even nothing.
            if (!Kernel::DryRun()) Kernel::WriteEeprom(name, 0, 0, {});
            throw HostCtlException(name + " has no EEPROM (its driver reports a size of 0 bytes)");
        }
        return size;
    } catch (const Kernel::EthtoolRefusal& refusal) {
        Refuse("Cannot write the EEPROM of " + name, refusal);
    }
}

void LinuxNics::WriteEeprom(const std::string& name, std::int64_t magic, std::int64_t offset,
                            const std::vector<std::uint8_t>& bytes) {
    const std::uint32_t size = BeginEepromWrite(name, magic);
    if (offset < 0 || offset + static_cast<std::int64_t>(bytes.size()) > static_cast<std::int64_t>(size)) {
        throw HostCtlException(std::to_string(bytes.size()) + " bytes at offset " + std::to_string(offset) +
                               " do not fit in " + EepromOf(name, size));
    }
    const auto at = static_cast<std::uint32_t>(offset);
    try {
        Kernel::WriteEeprom(name, static_cast<std::uint32_t>(magic), at, bytes);
        if (!Kernel::DryRun() &&
            Kernel::ReadEeprom(name, at, static_cast<std::uint32_t>(bytes.size())) != bytes) {
            throw HostCtlException(EepromOf(name, size) + " does not hold the " +
                                   std::to_string(bytes.size()) + " bytes written at offset " +
                                   std::to_string(offset));
        }
    } catch (const Kernel::EthtoolRefusal& refusal) {
        Refuse("Cannot write the EEPROM of " + name, refusal);
    }
}

// ---------------------------------------------------------------- self test and negotiation

// A self test disturbs the NIC (the offline test takes it out of service): it is a change.
// Each information line is a test's name and the driver's result for it (0: passed).
void LinuxNics::RunSelfTest(const std::string& name, Net::PnicSelfTestResult& result, bool online) {
    Require(name);
    context_.BeginChange();
    try {
        const auto test = Kernel::RunSelfTest(name, online, Kernel::ReadDriverInfo(name).testCount);
        result.failed = test.failed;
        result.info = test.lines;
    } catch (const Kernel::EthtoolRefusal& refusal) {
        Refuse("Cannot run the self test of " + name, refusal);
    }
}

void LinuxNics::RestartNegotiation(const std::string& name) {
    Require(name);
    context_.BeginChange();
    try {
        Kernel::RestartNegotiation(name);
    } catch (const Kernel::EthtoolRefusal& refusal) {
        // Drivers refuse a restart with auto-negotiation off as an invalid argument: say why.
        if (refusal.Code() == EINVAL) {
            const auto modes = GetIfSupported(ETHTOOL_MSG_LINKMODES_GET, name, "the link modes");
            if (modes && modes->Value(ETHTOOL_A_LINKMODES_AUTONEG, 0) != AUTONEG_ENABLE) {
                throw HostCtlException("Cannot restart auto-negotiation on " + name + ": " + refusal.what() +
                                       " (auto-negotiation is off: a speed and duplex are forced)");
            }
        }
        Refuse("Cannot restart auto-negotiation on " + name, refusal);
    }
}

}  // namespace TknCtl::Linux

// Netqueue on the Linux host: the queues of a NIC are its channels (ethtool -l), received
// traffic is spread over them by RSS (the driver's indirection table, ethtool -x). There is no
// netqueue load balancer and so no balancer plugins: the balancer shows disabled, with no
// plugins, and changing either is refused.
#include <linux/ethtool.h>
#include <linux/ethtool_netlink.h>

#include <cerrno>
#include <tuple>

#include "hostctl/exception.h"
#include "kernel/sysfs.h"
#include "network/pnic.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;
namespace Net = HostCtl::Network;

namespace {

// Indices of the load-balancer features (bit i of the mask) that Linux has a notion of.
constexpr std::size_t kRxQueuePair = 0;  // combined channels: an RX and a TX queue together
constexpr std::size_t kRss = 7;          // RSS: the indirection table spreads over more queues
constexpr std::size_t kLro = 8;          // LRO: the rx-lro feature

const char* const kFeatureNames[] = {"RxQPair",     "RxQNoFeature", "PreEmptibleQ", "RxQLatency",
                                     "RxDynamicLB", "DynamicQPool", "MacLearnLB",   "RSS",
                                     "LRO",         "GeneveOAM"};

struct Channels {
    bool reported = false;  // the driver reports channels
    std::uint64_t rx = 0, tx = 0, combined = 0;
    std::uint64_t rxMax = 0, txMax = 0, combinedMax = 0;
};

Channels ChannelsOf(const std::optional<Kernel::EthtoolReply>& reply) {
    Channels c;
    if (!reply) return c;
    c.reported = true;
    c.rx = reply->Value(ETHTOOL_A_CHANNELS_RX_COUNT);
    c.tx = reply->Value(ETHTOOL_A_CHANNELS_TX_COUNT);
    c.combined = reply->Value(ETHTOOL_A_CHANNELS_COMBINED_COUNT);
    c.rxMax = reply->Value(ETHTOOL_A_CHANNELS_RX_MAX);
    c.txMax = reply->Value(ETHTOOL_A_CHANNELS_TX_MAX);
    c.combinedMax = reply->Value(ETHTOOL_A_CHANNELS_COMBINED_MAX);
    return c;
}

bool Spreads(const std::vector<std::uint32_t>& table) {
    for (auto queue : table) {
        if (queue != table.front()) return true;
    }
    return false;
}

}  // namespace

// TX and RX queue counts: the channels of each direction, a combined channel counting in both
// (without channels from the driver: the queues the kernel uses). Features: RxQPair is
// supported with combined channels and allowed while there are some; RSS is supported with an
// indirection table and allowed while it spreads over more than one queue; LRO is supported
// where the driver lets rx-lro change and allowed while it is on. The other features have no
// Linux equivalent: unsupported and disallowed. Filter classes: a NIC with n-tuple filters
// (rx-ntuple-filter) steers by MAC address and VLAN; the kernel has no steering classes for
// encapsulated traffic.
void LinuxNics::GetNetqueueInfo(const std::string& name, Net::PnicNetqueueInfo& info) {
    Require(name);
    info = Net::PnicNetqueueInfo();
    const auto channels = ChannelsOf(GetIfSupported(ETHTOOL_MSG_CHANNELS_GET, name, "the channels"));
    if (channels.reported) {
        info.txQueueCount = static_cast<std::uint32_t>(channels.tx + channels.combined);
        info.rxQueueCount = static_cast<std::uint32_t>(channels.rx + channels.combined);
    } else {
        std::tie(info.rxQueueCount, info.txQueueCount) = Kernel::QueueCounts(sysfs_, name);
    }
    info.lbSupported[kRxQueuePair] = channels.combinedMax > 0;
    info.lbAllowed[kRxQueuePair] = channels.combined > 0;
    std::vector<std::uint32_t> table;
    try {
        table = Kernel::ReadRssTable(name);
    } catch (const Kernel::EthtoolRefusal& refusal) {
        if (!refusal.Unsupported()) Refuse("Cannot read the RSS indirection table of " + name, refusal);
    }
    info.lbSupported[kRss] = !table.empty();
    info.lbAllowed[kRss] = Spreads(table);
    const auto features = Get(ETHTOOL_MSG_FEATURES_GET, name, "the offload features");
    const auto* hw = features.Bitset(ETHTOOL_A_FEATURES_HW);
    const auto* active = features.Bitset(ETHTOOL_A_FEATURES_ACTIVE);
    info.lbSupported[kLro] = hw && hw->IsOn("rx-lro");
    info.lbAllowed[kLro] = active && active->IsOn("rx-lro");
    const bool ntuple = (hw && hw->IsOn("rx-ntuple-filter")) || (active && active->IsOn("rx-ntuple-filter"));
    info.filterMacOnly = info.filterVlanOnly = info.filterVlanMac = ntuple;
}

void LinuxNics::SetNetqueueInfo(const std::string& name, const Net::PnicNetqueueInfo& info) {
    Require(name);
    // What has no Linux equivalent is refused before anything changes.
    if (info.stateChanged) {
        throw HostCtlException(
            "The netqueue balancer is not available on a Linux host: the kernel has no queue load balancer; "
            "received traffic is spread over a NIC's queues by RSS, which its driver does");
    }
    if (info.pluginChanged) {
        std::string named;
        for (const auto& plugin : info.plugins)
            named += (named.empty() ? " (" : ", ") + plugin.moduleName + "/" + plugin.pluginName;
        throw HostCtlException(
            "Netqueue balancer plugins are not available on a Linux host: the kernel has none" +
            (named.empty() ? std::string() : named + ")"));
    }
    if (info.lbMask & ~((1u << std::size(kFeatureNames)) - 1))
        throw HostCtlException("Unknown netqueue load balancer mask bits " +
                               std::to_string(info.lbMask & ~((1u << std::size(kFeatureNames)) - 1)));
    for (std::size_t i = 0; i < std::size(kFeatureNames); ++i) {
        if ((info.lbMask & (1u << i)) && i != kRss && i != kLro) {
            throw HostCtlException("The netqueue load balancer feature " + std::string(kFeatureNames[i]) +
                                   " is not available on a Linux host: only RSS (the driver's indirection "
                                   "table) and LRO (the rx-lro feature) can be set");
        }
    }
    if (info.lbMask == 0 && !info.setTxCount && !info.setRxCount) return;

    if (info.setTxCount || info.setRxCount) {
        const auto channels = ChannelsOf(Get(ETHTOOL_MSG_CHANNELS_GET, name, "the channels"));
        // A direction with channels of its own takes the count there, on top of the combined
        // channels; a NIC with combined channels only changes both directions at once.
        std::map<int, std::uint32_t> wanted;
        auto direction = [&](const char* what, std::uint32_t count, std::uint64_t own, int attribute) {
            if (own > 0 || channels.combinedMax == 0) {
                if (count < channels.combined) {
                    throw HostCtlException(std::string(what) + " netqueue count " + std::to_string(count) +
                                           " is below the " + std::to_string(channels.combined) +
                                           " combined channels of " + name);
                }
                wanted[attribute] = count - static_cast<std::uint32_t>(channels.combined);
            } else {
                auto [it, fresh] = wanted.emplace(ETHTOOL_A_CHANNELS_COMBINED_COUNT, count);
                if (!fresh && it->second != count) {
                    throw HostCtlException(name +
                                           " has combined channels only: its TX and RX netqueue counts "
                                           "change together and cannot differ");
                }
            }
        };
        if (info.setTxCount) direction("TX", info.txQueueCount, channels.txMax, ETHTOOL_A_CHANNELS_TX_COUNT);
        if (info.setRxCount) direction("RX", info.rxQueueCount, channels.rxMax, ETHTOOL_A_CHANNELS_RX_COUNT);
        context_.RequireUndoable(Context::kDriverSettings);
        context_.BeginChange();
        Change(Kernel::BuildEthtoolSet(Ethtool().Family(), ETHTOOL_MSG_CHANNELS_SET, name, wanted), name,
               "the channels");
        // (A dry run changed nothing to read back, here and below.)
        if (!Kernel::DryRun()) {
            const auto now = ChannelsOf(Get(ETHTOOL_MSG_CHANNELS_GET, name, "the channels"));
            if (info.setTxCount && now.tx + now.combined != info.txQueueCount)
                throw HostCtlException(name + " has " + std::to_string(now.tx + now.combined) +
                                       " TX queues after it was set to " + std::to_string(info.txQueueCount));
            if (info.setRxCount && now.rx + now.combined != info.rxQueueCount)
                throw HostCtlException(name + " has " + std::to_string(now.rx + now.combined) +
                                       " RX queues after it was set to " + std::to_string(info.rxQueueCount));
        }
    }
    if (info.lbMask & (1u << kLro)) {
        Net::PnicOffloadSettings lro;
        lro.mask = Net::PNIC_OFFLOAD_LRO;
        lro.lro = info.lbAllowed[kLro];
        SetOffloadSettings(name, lro);
    }
    if (info.lbMask & (1u << kRss)) {
        // Allowed: the driver's default table, over every RX queue. Disallowed: all to queue 0.
        const bool spread = info.lbAllowed[kRss];
        try {
            auto table = Kernel::ReadRssTable(name);
            if (table.empty())
                throw Kernel::EthtoolRefusal(EOPNOTSUPP, "the driver keeps no RSS indirection table");
            if (Spreads(table) != spread) {
                const auto channels =
                    ChannelsOf(GetIfSupported(ETHTOOL_MSG_CHANNELS_GET, name, "the channels"));
                if (spread && channels.reported && channels.rx + channels.combined < 2)
                    throw HostCtlException(name +
                                           " has one RX queue: RSS has nothing to spread traffic over");
                context_.RequireUndoable(Context::kDriverSettings);
                context_.BeginChange();
                Kernel::WriteRssTable(name, spread ? std::vector<std::uint32_t>()
                                                   : std::vector<std::uint32_t>(table.size(), 0));
                if (!Kernel::DryRun() && Spreads(Kernel::ReadRssTable(name)) != spread) {
                    throw HostCtlException(name +
                                           (spread ? " RSS still sends everything to one queue after it was "
                                                     "allowed"
                                                   : " RSS still spreads over several queues after it was "
                                                     "disallowed"));
                }
            }
        } catch (const Kernel::EthtoolRefusal& refusal) {
            Refuse("Cannot change the RSS indirection table of " + name, refusal);
        }
    }
}

}  // namespace TknCtl::Linux

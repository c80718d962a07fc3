#include "kernel/vlan_stats.h"

#include <linux/if_bridge.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <netlink/netlink.h>
#include <sys/socket.h>

#include <cstring>
#include <memory>

#include "hostctl/exception.h"
#include "kernel/dryrun.h"
#include "kernel/ethtool.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};
using Message = std::unique_ptr<nl_msg, MessageFree>;

void Require(int result) {
    if (result < 0) throw HostCtlException("cannot build a bridge request: " + ErrorText(result));
}

}  // namespace

nl_msg* BuildPortVlanStatsRequest(int portIndex) {
    Message message(nlmsg_alloc_simple(RTM_GETSTATS, NLM_F_REQUEST));
    if (!message) throw HostCtlException("cannot build a bridge request: out of memory");
    if_stats_msg header{};
    header.family = AF_UNSPEC;
    header.ifindex = static_cast<std::uint32_t>(portIndex);
    header.filter_mask = IFLA_STATS_FILTER_BIT(IFLA_STATS_LINK_XSTATS_SLAVE);
    Require(nlmsg_append(message.get(), &header, sizeof header, NLMSG_ALIGNTO));
    return message.release();
}

std::vector<VlanCounters> ParsePortVlanStats(nl_msg* reply) {
    std::vector<VlanCounters> out;
    nlmsghdr* header = nlmsg_hdr(reply);
    if (header->nlmsg_type != RTM_NEWSTATS || !nlmsg_valid_hdr(header, sizeof(if_stats_msg))) return out;
    nlattr* slave;
    int slaveRem;
    nlmsg_for_each_attr(slave, header, sizeof(if_stats_msg), slaveRem) {
        if (nla_type(slave) != IFLA_STATS_LINK_XSTATS_SLAVE) continue;
        nlattr* kind;
        int kindRem;
        nla_for_each_nested(kind, slave, kindRem) {
            if (nla_type(kind) != LINK_XSTATS_TYPE_BRIDGE) continue;
            nlattr* entry;
            int entryRem;
            nla_for_each_nested(entry, kind, entryRem) {
                if (nla_type(entry) != BRIDGE_XSTATS_VLAN ||
                    nla_len(entry) < static_cast<int>(sizeof(bridge_vlan_xstats)))
                    continue;
                bridge_vlan_xstats vlan;
                std::memcpy(&vlan, nla_data(entry), sizeof vlan);
                out.push_back({vlan.vid, vlan.rx_packets, vlan.tx_packets});
            }
        }
    }
    return out;
}

nl_msg* BuildBridgeVlanStatsChange(int bridgeIndex, bool enabled) {
    Message message(nlmsg_alloc_simple(RTM_NEWLINK, NLM_F_REQUEST));
    if (!message) throw HostCtlException("cannot build a bridge request: out of memory");
    ifinfomsg header{};
    header.ifi_family = AF_UNSPEC;
    header.ifi_index = bridgeIndex;
    Require(nlmsg_append(message.get(), &header, sizeof header, NLMSG_ALIGNTO));
    nlattr* info = nla_nest_start(message.get(), IFLA_LINKINFO);
    if (!info) throw HostCtlException("cannot build a bridge request: out of memory");
    Require(nla_put_string(message.get(), IFLA_INFO_KIND, "bridge"));
    nlattr* data = nla_nest_start(message.get(), IFLA_INFO_DATA);
    if (!data) throw HostCtlException("cannot build a bridge request: out of memory");
    Require(nla_put_u8(message.get(), IFLA_BR_VLAN_STATS_ENABLED, enabled ? 1 : 0));
    // Counted per port, so that each uplink's counters are its own.
    if (enabled) Require(nla_put_u8(message.get(), IFLA_BR_VLAN_STATS_PER_PORT, 1));
    nla_nest_end(message.get(), data);
    nla_nest_end(message.get(), info);
    return message.release();
}

std::vector<VlanCounters> ReadPortVlanStats(const Namespace& ns, int portIndex) {
    std::vector<VlanCounters> out;
    Transact(RouteSocket(ns), BuildPortVlanStatsRequest(portIndex), [&](nl_msg* reply) {
        auto entries = ParsePortVlanStats(reply);
        out.insert(out.end(), entries.begin(), entries.end());
    });
    return out;
}

void ChangeBridgeVlanStats(const Namespace& ns, int bridgeIndex, bool enabled) {
    if (DryRun()) {
        std::unique_ptr<nl_msg, decltype(&nlmsg_free)> request(
            BuildBridgeVlanStatsChange(bridgeIndex, enabled), &nlmsg_free);
        return RehearseRequest(ns, nlmsg_hdr(request.get()));
    }
    Transact(RouteSocket(ns), BuildBridgeVlanStatsChange(bridgeIndex, enabled), [](nl_msg*) {});
}

}  // namespace TknCtl::Linux::Kernel

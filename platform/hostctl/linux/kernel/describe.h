// The lines of a dry run (kernel/dryrun.h): one kernel request each, in a short form of its own
// that names the object first, then what is done to it, then its details, in the words of the
// peer tools where they have some:
//
//     link add tkn3-port type veth mtu 1500 address fe:12:34:56:78:9a peer tkn3 mtu 1500 in netstack glidex
//     link set vmnic1 down
//     link set vmnic1 master vSwitch1
//     link delete tkn3-port
//     address add 10.0.0.5/24 dev tkn3
//     route add default via 10.0.0.1 dev tkn3 table main proto static
//     neighbour delete 10.0.0.9 dev eth0
//     bridge port set tkn3-port learning off flood off locked on
//     bridge vlan add dev tkn3-port vid 20 pvid untagged
//     fdb add 02:00:00:00:00:01 dev tkn3-port master static
//     qdisc replace dev tkn3-port root tbf rate 12500000 bytes/s burst 1048576 bytes limit 1673576 bytes
//     sysctl net.core.somaxconn = 256
//     namespace add glidex2
//     file write /etc/resolv.conf (nameserver 10.0.0.9, search lab.example)
//     nftables replace table inet hadro (input policy drop; sshServer: 1 rule, all addresses)
//     xfrm policy add src ::/0 dst 2001:db8::/64 proto tcp dport 22 dir out action allow tmpl esp transport
//     ethtool rings set vmnic0 rx 512 tx 512
//
// Dry runs add "kernel: " before and " (netstack NAME)" after what is made in a namespace. Keys
// of IPsec associations are never shown. Each function takes plain values or a request as it
// would be sent, so that the lines are tested without a kernel.
#pragma once

#include <functional>
#include <string>

#include "kernel/nftables.h"
#include "kernel/qdiscs.h"
#include "kernel/veth.h"

struct nl_msg;
struct nlmsghdr;

namespace TknCtl::Linux::Kernel {

// The name of a device by its index, as a line shows it.
using DeviceNames = std::function<std::string(int index)>;

// An rtnetlink request: a link (made, changed or deleted), an address, a route, a neighbour, a
// bridge port's flags or VLANs, a forwarding entry. Empty for a message of another kind.
std::string DescribeRouteRequest(const nlmsghdr* request, const DeviceNames& names);
// A veth pair made: the end, and the peer (in netstack peerNetstack when it is not empty).
std::string DescribeVethAdd(const VethPair& pair, const std::string& peerNetstack);
// A root token bucket put on a device, or taken off it.
std::string DescribeTokenBucket(const std::string& device, const TokenBucket& bucket);
std::string DescribeRootDelete(const std::string& device);
// A request of the xfrm layer: a state or a policy added or deleted. Empty for another message.
std::string DescribeXfrmRequest(nl_msg* request);
// A SET request of the ethtool family: "ethtool rings set vmnic0 rx 512". Empty for another.
std::string DescribeEthtoolRequest(nl_msg* request);
// The firewall's table written as a whole, or deleted.
std::string DescribeFirewall(const NftFirewall& firewall);
std::string DescribeFirewallDelete();
// A setting written: "sysctl net.ipv4.tcp_congestion_control = reno".
std::string DescribeSysctl(const std::string& name, const std::string& value);
// A resolver configuration written: its name servers and search domains.
std::string DescribeResolvConf(const std::string& path, const std::string& text);

}  // namespace TknCtl::Linux::Kernel

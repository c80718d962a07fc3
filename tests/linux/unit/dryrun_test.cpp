// Dry runs of the Linux host without a kernel: the line each request a change would send reads
// as (from the very requests the host builds), and the links later steps see.
#include <gtest/gtest.h>
#include <linux/ethtool.h>
#include <linux/ethtool_netlink.h>
#include <linux/rtnetlink.h>
#include <netlink/msg.h>

#include <memory>
#include <string>
#include <vector>

#include "kernel/addresses.h"
#include "kernel/bridges.h"
#include "kernel/describe.h"
#include "kernel/dryrun.h"
#include "kernel/ethtool.h"
#include "kernel/links.h"
#include "kernel/neighbours.h"
#include "kernel/routes.h"
#include "kernel/xfrm.h"

namespace {

namespace K = TknCtl::Linux::Kernel;

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};
using Message = std::unique_ptr<nl_msg, MessageFree>;

std::string Names(int index) {
    switch (index) {
        case 2:
            return "eth0";
        case 5:
            return "br0";
        case 7:
            return "tkn3-port";
        default:
            return "#" + std::to_string(index);
    }
}

std::string Line(nl_msg* built) {
    Message message(built);
    return K::DescribeRouteRequest(nlmsg_hdr(message.get()), Names);
}

TEST(DryRunLines, RoutesAddressesAndNeighboursNameTheirDevice) {
    K::Route route;
    route.family = AF_INET;
    route.destination = "10.2.0.0";
    route.prefixLength = 16;
    route.protocol = RTPROT_STATIC;
    route.nexthops.push_back({"10.1.0.1", 2});
    EXPECT_EQ(Line(K::BuildRouteRequest(RTM_NEWROUTE, route)),
              "route add 10.2.0.0/16 via 10.1.0.1 dev eth0 table main proto static");
    route.family = AF_INET6;
    route.destination = "::";
    route.prefixLength = 0;
    route.metric = 1024;
    route.protocol = 0;
    route.nexthops = {{"fe80::1", 2}};
    EXPECT_EQ(Line(K::BuildRouteRequest(RTM_DELROUTE, route)),
              "route delete default via fe80::1 dev eth0 table main metric 1024");

    K::Address address;
    address.family = AF_INET;
    address.index = 2;
    address.address = "10.1.0.5";
    address.prefixLength = 24;
    EXPECT_EQ(Line(K::BuildAddressRequest(RTM_NEWADDR, address)), "address add 10.1.0.5/24 dev eth0");
    EXPECT_EQ(Line(K::BuildAddressRequest(RTM_DELADDR, address)), "address delete 10.1.0.5/24 dev eth0");

    K::Neighbour neighbour;
    neighbour.family = AF_INET6;
    neighbour.index = 2;
    neighbour.address = "2001:db8::9";
    EXPECT_EQ(Line(K::BuildNeighbourDelete(neighbour)), "neighbour delete 2001:db8::9 dev eth0");
}

TEST(DryRunLines, LinksBridgesAndTheirPorts) {
    K::LinkChange down;
    down.up = false;
    EXPECT_EQ(Line(K::BuildLinkChange(2, down)), "link set eth0 down");
    K::LinkChange several;
    several.up = true;
    several.mtu = 9000;
    several.mac = "02:00:00:00:00:42";
    several.master = 5;
    EXPECT_EQ(Line(K::BuildLinkChange(2, several)),
              "link set eth0 up mtu 9000 address 02:00:00:00:00:42 master br0");
    K::LinkChange leave;
    leave.master = 0;
    EXPECT_EQ(Line(K::BuildLinkChange(7, leave)), "link set tkn3-port nomaster");

    EXPECT_EQ(Line(K::BuildBridgeAdd("vs1", 1500)), "link add vs1 type bridge mtu 1500");
    EXPECT_EQ(Line(K::BuildLinkDelete(5)), "link delete br0");
    EXPECT_EQ(Line(K::BuildBridgeVlanFiltering(5, true)), "link set br0 type bridge vlan_filtering 1");
    K::PortFlagsChange flags;
    flags.learning = false;
    flags.unicastFlood = false;
    flags.locked = true;
    EXPECT_EQ(Line(K::BuildPortFlags(7, flags)),
              "bridge port set tkn3-port learning off flood off locked on");
    EXPECT_EQ(Line(K::BuildPortVlans(7, {{1, 4094, false, false}, {1, 0, true, true}}, true)),
              "bridge vlan add dev tkn3-port vid 1-4094, vid 1 pvid untagged");
    EXPECT_EQ(Line(K::BuildPortVlans(7, {{20, 0, true, true}}, false)),
              "bridge vlan delete dev tkn3-port vid 20 pvid untagged");
    EXPECT_EQ(Line(K::BuildStaticEntry(7, "02:00:00:00:00:01", true)),
              "fdb add 02:00:00:00:00:01 dev tkn3-port master static");
    // A device the lines do not know is named by its index; another kind of message says nothing.
    EXPECT_EQ(Line(K::BuildLinkDelete(42)), "link delete #42");
    EXPECT_EQ(Line(nlmsg_alloc_simple(RTM_GETLINK, 0)), "");

    K::VethPair pair;
    pair.end = {"tkn3-port", "fe:01:02:03:04:05", 1500, 0, 0};
    pair.peer = {"tkn3", "", 9000, 4, 65536};
    EXPECT_EQ(
        K::DescribeVethAdd(pair, "glidex"),
        "link add tkn3-port type veth mtu 1500 address fe:01:02:03:04:05 peer tkn3 mtu 9000 numrxqueues 4 "
        "gso_max_size 65536 in netstack glidex");
    K::TokenBucket bucket{12500000, 1048576, 25000000, 1518, 1673576};
    EXPECT_EQ(
        K::DescribeTokenBucket("e1", bucket),
        "qdisc replace dev e1 root tbf rate 12500000 bytes/s burst 1048576 bytes peakrate 25000000 bytes/s "
        "mtu 1518 bytes limit 1673576 bytes");
    EXPECT_EQ(K::DescribeRootDelete("e1"), "qdisc delete dev e1 root");
}

TEST(DryRunLines, IpsecNeverShowsItsKeys) {
    K::XfrmState state;
    state.source = "2001:db8::1";
    state.destination = "2001:db8::2";
    state.spi = 0x1234;
    state.encryption = K::EncryptionByName("aes128-cbc");
    state.encryption->key = "secret-key-16-by";
    state.integrity = K::IntegrityByName("hmac-sha1");
    state.integrity->key = "integrity-key-20-byt";
    Message add(K::BuildStateAdd(state));
    const std::string line = K::DescribeXfrmRequest(add.get());
    EXPECT_EQ(
        line,
        "xfrm state add src 2001:db8::1 dst 2001:db8::2 proto esp spi 0x00001234 mode transport enc cbc(aes) "
        "auth hmac(sha1)");
    EXPECT_EQ(line.find("secret"), std::string::npos);
    Message remove(K::BuildStateDelete(state));
    EXPECT_EQ(K::DescribeXfrmRequest(remove.get()),
              "xfrm state delete dst 2001:db8::2 proto esp spi 0x00001234");

    K::XfrmPolicy policy;
    policy.selector.destination = "2001:db8::";
    policy.selector.destinationPrefix = 64;
    policy.selector.protocol = IPPROTO_TCP;
    policy.selector.destinationPort = 22;
    policy.templates.push_back({});
    Message addPolicy(K::BuildPolicyAdd(policy));
    EXPECT_EQ(K::DescribeXfrmRequest(addPolicy.get()),
              "xfrm policy add src ::/0 dst 2001:db8::/64 proto tcp dport 22 dir out action allow tmpl esp "
              "transport");
    policy.index = 9;
    policy.direction = K::kXfrmIn;
    Message removePolicy(K::BuildPolicyDelete(policy));
    EXPECT_EQ(K::DescribeXfrmRequest(removePolicy.get()), "xfrm policy delete dir in index 9");
}

TEST(DryRunLines, EthtoolFirewallSettingsAndFiles) {
    constexpr int kFamily = 20;
    Message rings(K::BuildEthtoolSet(kFamily, ETHTOOL_MSG_RINGS_SET, "vmnic0",
                                     {{ETHTOOL_A_RINGS_RX, 512}, {ETHTOOL_A_RINGS_TX, 1024}}));
    EXPECT_EQ(K::DescribeEthtoolRequest(rings.get()), "ethtool rings set vmnic0 rx 512 tx 1024");
    Message pause(K::BuildEthtoolSet(kFamily, ETHTOOL_MSG_PAUSE_SET, "vmnic0",
                                     {{ETHTOOL_A_PAUSE_AUTONEG, 0}, {ETHTOOL_A_PAUSE_RX, 1}}));
    EXPECT_EQ(K::DescribeEthtoolRequest(pause.get()), "ethtool pause set vmnic0 autoneg 0 rx 1");
    Message features(
        K::BuildFeaturesSet(kFamily, "vmnic0", {{"rx-gro", true}, {"tx-scatter-gather", false}}));
    EXPECT_EQ(K::DescribeEthtoolRequest(features.get()),
              "ethtool features set vmnic0 rx-gro on tx-scatter-gather off");
    Message wol(K::BuildEthtoolBitsetSet(kFamily, ETHTOOL_MSG_WOL_SET, "vmnic0", ETHTOOL_A_WOL_MODES,
                                         WAKE_MAGIC | WAKE_PHY));
    EXPECT_EQ(K::DescribeEthtoolRequest(wol.get()), "ethtool wol set vmnic0 wol pg");
    Message get(K::BuildEthtoolGet(kFamily, ETHTOOL_MSG_RINGS_GET, "vmnic0"));
    EXPECT_EQ(K::DescribeEthtoolRequest(get.get()), "");  // a read is no change

    K::NftFirewall firewall;
    firewall.enabled = true;
    firewall.pass = false;
    firewall.rulesets.push_back({"sshServer", {K::NftRule{}}, true, {}});
    firewall.rulesets.push_back(
        {"webAccess", {K::NftRule{}, K::NftRule{}}, false, {"192.0.2.0/24", "2001:db8::1"}});
    EXPECT_EQ(
        K::DescribeFirewall(firewall),
        "nftables replace table inet hadro (input policy drop; sshServer: 1 rule, all addresses; webAccess: "
        "2 rules, from 192.0.2.0/24 2001:db8::1)");
    firewall.enabled = false;
    firewall.rulesets.clear();
    firewall.dynamicRules.push_back({});
    EXPECT_EQ(K::DescribeFirewall(firewall),
              "nftables replace table inet hadro (input accepts everything; 1 dynamic rule)");
    EXPECT_EQ(K::DescribeFirewallDelete(), "nftables delete table inet hadro");

    EXPECT_EQ(K::DescribeSysctl("ipv6/conf/tkn3/accept_ra", "0"), "sysctl net.ipv6.conf.tkn3.accept_ra = 0");
    EXPECT_EQ(
        K::DescribeResolvConf("/etc/resolv.conf",
                              "# kept\nnameserver 10.0.0.9\noptions ndots:2\nsearch a.example b.example\n"),
        "file write /etc/resolv.conf (nameserver 10.0.0.9, search a.example b.example)");
    EXPECT_EQ(K::DescribeResolvConf("/etc/netns/x/resolv.conf", "options ndots:2\n"),
              "file write /etc/netns/x/resolv.conf (no name server, no search domain)");
}

// ---------------------------------------------------------------- what later steps see

K::Link RealLink(int index, const std::string& name, int master = 0) {
    K::Link link;
    link.index = index;
    link.name = name;
    link.mtu = 1500;
    link.up = true;
    link.master = master;
    return link;
}

K::LinkPlan Plan(const std::string& ns, int index, bool gone = false) {
    K::LinkPlan plan;
    plan.ns = ns;
    plan.index = index;
    plan.gone = gone;
    return plan;
}

TEST(DryRunPlans, LinksMadeChangedAndDeletedAreSeenAsTheKernelWouldHoldThem) {
    std::vector<K::LinkPlan> plans{Plan("", K::kPlannedIndex), Plan("", 3), Plan("", 5, true),
                                   Plan("glidex", 8, true)};
    plans[0].made = true;  // bridge vs1, brought up
    plans[0].name = "vs1";
    plans[0].kind = "bridge";
    plans[0].mtu = 1500;
    plans[0].change.up = true;
    plans[1].change.master = K::kPlannedIndex;  // e1 joins vs1
    plans[1].change.mtu = 9000;
    // br0 (5) goes, and its port e2 leaves it.

    std::vector<K::Link> links{RealLink(1, "lo"), RealLink(3, "e1"), RealLink(4, "e2", 5),
                               RealLink(5, "br0")};
    K::ApplyLinkPlans(plans, "", links);
    ASSERT_EQ(links.size(), 4u);
    EXPECT_EQ(links[1].name, "e1");
    EXPECT_EQ(links[1].master, K::kPlannedIndex);
    EXPECT_EQ(links[1].mtu, 9000u);
    EXPECT_EQ(links[2].name, "e2");
    EXPECT_EQ(links[2].master, 0);
    EXPECT_EQ(links[3].name, "vs1");
    EXPECT_EQ(links[3].index, K::kPlannedIndex);
    EXPECT_TRUE(links[3].up);
    EXPECT_EQ(links[3].kind, "bridge");
    ASSERT_TRUE(links[3].ipv6.has_value());  // a fresh device has IPv6, as the kernel gives it

    std::vector<K::BridgeLink> bridged(3);
    bridged[0].index = 3;
    bridged[0].name = "e1";
    bridged[1].index = 6;
    bridged[1].name = "br1";
    bridged[1].bridge = K::BridgeInfo{true, false, 1, false};
    bridged[2].index = 7;
    bridged[2].name = "p7";
    bridged[2].master = 6;
    bridged[2].port = K::PortInfo{};
    bridged[2].port->hasLocked = true;
    K::ApplyLinkPlans(plans, "", bridged);
    ASSERT_EQ(bridged.size(), 4u);
    EXPECT_EQ(bridged[0].master, K::kPlannedIndex);
    EXPECT_EQ(bridged[0].masterKind, "bridge");
    ASSERT_TRUE(bridged[0].port.has_value());
    EXPECT_TRUE(bridged[0].port->hasLocked);  // as the kernel's own ports say
    ASSERT_TRUE(bridged[3].bridge.has_value());
    EXPECT_TRUE(bridged[3].bridge->vlanFilteringAvailable);

    // One link by name: a link made is found, a link gone is not, another namespace's plans
    // leave it alone.
    EXPECT_EQ(K::ApplyLinkPlans(plans, "", "vs1", std::nullopt)->index, K::kPlannedIndex);
    EXPECT_FALSE(K::ApplyLinkPlans(plans, "", "br0", RealLink(5, "br0")));
    EXPECT_TRUE(K::ApplyLinkPlans(plans, "glidex", "br0", RealLink(5, "br0")));
    EXPECT_FALSE(K::ApplyLinkPlans(plans, "", "nothing", std::nullopt));
}

}  // namespace

// Every command on the Linux host: each of them, with the options it needs, on a host of two
// bridges, four NICs, two netstacks, addresses, routes, a neighbour, a foreign nftables table
// and an xfrm policy. Each either works or gives its documented refusal; none ends in an
// unexpected failure, and none that is refused leaves the host changed.
#include <algorithm>
#include <set>
#include <string>
#include <vector>

#include "namespace_host.h"

namespace {

struct Line {
    const char* command;  // after "network"
    int status;           // 0 works; 1 refused
    const char* refusal;  // the start of the refusal
};

// In the order they run: what one line makes, a later one uses or removes.
const std::vector<Line>& Lines() {
    static const std::vector<Line> lines = {
        {"ip get", 0, ""},
        {"ip set -e true", 0, ""},
        {"ip neighbor list", 0, ""},
        {"ip neighbor remove -v 4 -a 10.1.0.77", 0, ""},
        {"ip connection list", 0, ""},
        {"ip dns server list", 0, ""},
        {"ip dns server add -s 10.0.0.53", 0, ""},
        {"ip dns server remove -s 10.0.0.53", 0, ""},
        {"ip dns search add -d sweep.example", 0, ""},
        {"ip dns search list", 0, ""},
        {"ip dns search remove -d sweep.example", 0, ""},
        {"ip route ipv4 add -n 10.99.0.0/16 -g 10.1.0.1", 0, ""},
        {"ip route ipv4 list", 0, ""},
        {"ip route ipv4 remove -n 10.99.0.0/16 -g 10.1.0.1", 0, ""},
        {"ip route ipv6 add -n 2001:db8:99::/48 -g 2001:db8:1::1", 0, ""},
        {"ip route ipv6 list", 0, ""},
        {"ip route ipv6 remove -n 2001:db8:99::/48 -g 2001:db8:1::1", 0, ""},
        {"ip ipsec sa add -n sa1 -s 2001:db8:1::5 -d 2001:db8:2::5 -p 0x1000 -e aes128-cbc -k "
         "0123456789abcdef -i hmac-sha1 -K 0123456789abcdef0123",
         1, "Cannot add Security Association 'sa1': the kernel of this Linux host h"},
        {"ip ipsec sa list", 0, ""},
        {"ip ipsec sa remove -a", 0, ""},
        {"ip ipsec sp add -n sp1 -s 2001:db8:1::/64 -d 2001:db8:2::/64 -p 0 -P 0 -A discard -w out", 0, ""},
        {"ip ipsec sp list", 0, ""},
        {"ip ipsec sp remove -n sp1", 0, ""},
        {"ip interface list", 0, ""},
        {"ip interface set -i tkn0 -m 1400", 0, ""},
        {"ip interface ipv4 get", 0, ""},
        {"ip interface ipv4 set -i tkn0 -t static -I 10.1.0.5 -N 255.255.255.0 -g 10.1.0.1", 0, ""},
        {"ip interface ipv4 address list", 0, ""},
        {"ip interface ipv6 set -i tkn0 -e true", 0, ""},
        {"ip interface ipv6 get", 0, ""},
        {"ip interface ipv6 address list", 0, ""},
        {"ip interface ipv6 address add -i tkn0 -I 2001:db8:1::7/64", 0, ""},
        {"ip interface ipv6 address remove -i tkn0 -I 2001:db8:1::7/64", 0, ""},
        {"ip interface tag add -i tkn0 -t Management", 0, ""},
        {"ip interface tag get -i tkn0", 0, ""},
        {"ip interface tag remove -i tkn0 -t Management", 0, ""},
        {"ip netstack list", 0, ""},
        {"ip netstack add -N sweep", 0, ""},
        {"ip netstack get -N sweep", 0, ""},
        {"ip netstack set -N sweep -m 4096 -c newreno", 0, ""},
        {"ip netstack remove -N sweep", 0, ""},
        {"multicast group list", 0, ""},
        {"nic list", 0, ""},
        {"nic get -n vmnic1", 0, ""},
        {"nic set -n vmnic1 -V 02:00:00:00:10:01", 0, ""},
        {"nic down -n vmnic3", 0, ""},
        {"nic up -n vmnic3", 0, ""},
        {"nic stats get -n vmnic1", 0, ""},
        {"nic vlan stats get -n vmnic0", 1, "VLAN stats are disabled for vmnic0 please enable them first."},
        {"nic vlan stats set -n vmnic0 -e true", 1,
         "Unable to set VLAN stats: VLAN statistics of vmnic0 are not available:"},
        {"nic coalesce get", 0, ""},
        {"nic coalesce set -n vmnic1 -r 10", 1,
         "Cannot read the coalesce parameters of vmnic1: Operation not supported"},
        {"nic coalesce low get -n vmnic1", 1,
         "Cannot read the coalesce parameters of vmnic1: Operation not supported"},
        {"nic coalesce low set -n vmnic1 -r 5", 1,
         "Cannot read the coalesce parameters of vmnic1: Operation not supported"},
        {"nic coalesce high get -n vmnic1", 1,
         "Cannot read the coalesce parameters of vmnic1: Operation not supported"},
        {"nic coalesce high set -n vmnic1 -r 50", 1,
         "Cannot read the coalesce parameters of vmnic1: Operation not supported"},
        {"nic cso get", 0, ""},
        {"nic cso set -n vmnic1 -e 0", 0, ""},
        {"nic tso get", 0, ""},
        {"nic tso set -n vmnic1 -e 0", 0, ""},
        {"nic sg get", 0, ""},
        {"nic sg set -n vmnic1 -e 1", 0, ""},
        {"nic pauseParams list", 0, ""},
        {"nic pauseParams set -n vmnic1 -r true", 1,
         "Cannot change the pause parameters of vmnic1: Operation not supported"},
        {"nic register dump -n vmnic1", 1, "Cannot dump the registers of vmnic1: Operation not supported"},
        {"nic eeprom dump -n vmnic1", 1, "Cannot dump the EEPROM of vmnic1: Operation not supported"},
        {"nic eeprom change -n vmnic1 -o 0 -v 1 -m 0", 1,
         "Cannot write the EEPROM of vmnic1: Operation not supported"},
        {"nic negotiate restart -n vmnic1", 1,
         "Cannot restart auto-negotiation on vmnic1: Operation not supported"},
        {"nic selftest run -n vmnic1", 1, "Cannot run the self test of vmnic1: Operation not supported"},
        {"nic queue loadbalancer list", 0, ""},
        {"nic queue loadbalancer set -n vmnic1 --rsslb true", 1,
         "Cannot change the RSS indirection table of vmnic1: Operation not suppo"},
        {"nic queue loadbalancer state list", 0, ""},
        {"nic queue loadbalancer state set -n vmnic1 -e true", 1,
         "The netqueue balancer is not available on a Linux host: the kernel has"},
        {"nic queue loadbalancer plugin list", 0, ""},
        {"nic queue loadbalancer plugin set -n vmnic1 -e true -m mod -p plug", 1,
         "Netqueue balancer plugins are not available on a Linux host: the kerne"},
        {"nic queue count get", 0, ""},
        {"nic queue count set -n vmnic1 -r true -q 1", 0, ""},
        {"nic queue filterclass list", 0, ""},
        {"nic software list", 0, ""},
        {"nic software set -n vmnic1 --ipv4tso false", 0, ""},
        {"nic ring preset get -n vmnic1", 1, "Cannot read the ring sizes of vmnic1: Operation not supported"},
        {"nic ring current get -n vmnic1", 1,
         "Cannot read the ring sizes of vmnic1: Operation not supported"},
        {"nic ring current set -n vmnic1 -r 256", 1,
         "Cannot change the ring sizes of vmnic1: Operation not supported"},
        {"sriovnic list", 0, ""},
        {"sriovnic vf list -n vmnic1", 1, "There is no SRIOV Nic with name vmnic1"},
        {"sriovnic vf stats -n vmnic1 -v 0", 1, "There is no SRIOV Nic with name vmnic1"},
        {"vswitch standard list", 0, ""},
        {"vswitch standard add -v vSwitch9", 0, ""},
        {"vswitch standard set -v vSwitch9 -m 1600 -c both", 0, ""},
        {"vswitch standard uplink add -v vSwitch9 -u vmnic3", 0, ""},
        {"vswitch standard uplink remove -v vSwitch9 -u vmnic3", 0, ""},
        {"vswitch standard policy shaping get -v vSwitch0", 0, ""},
        {"vswitch standard policy shaping set -v vSwitch0 -e true -b 100000 -k 200000 -t 1024", 0, ""},
        {"vswitch standard policy security get -v vSwitch0", 0, ""},
        {"vswitch standard policy security set -v vSwitch0 -m false", 0, ""},
        {"vswitch standard policy failover get -v vSwitch0", 0, ""},
        {"vswitch standard policy failover set -v vSwitch0 -a vmnic0", 0, ""},
        {"vswitch standard portgroup add -p Lab -v vSwitch0", 0, ""},
        {"vswitch standard portgroup list", 0, ""},
        {"vswitch standard portgroup set -p Lab -v 0", 0, ""},
        {"vswitch standard portgroup policy shaping get -p Lab", 0, ""},
        {"vswitch standard portgroup policy shaping set -p Lab -e true -b 50000 -k 100000 -t 512", 0, ""},
        {"vswitch standard portgroup policy failover get -p Lab", 0, ""},
        {"vswitch standard portgroup policy failover set -p Lab -u", 0, ""},
        {"vswitch standard portgroup policy security get -p Lab", 0, ""},
        {"vswitch standard portgroup policy security set -p Lab -f false", 0, ""},
        {"ip interface add -p Lab -i tkn7", 0, ""},
        {"ip interface remove -i tkn7", 0, ""},
        {"vswitch standard portgroup remove -p Lab -v vSwitch0", 0, ""},
        {"vswitch standard remove -v vSwitch9", 0, ""},
        {"vswitch dvs talvex list", 0, ""},
        {"vswitch dvs talvex lacp config get", 1,
         "LACP is supported on Talvex DVSwitch only, and there is no DVSwitch co"},
        {"vswitch dvs talvex lacp status get", 1,
         "LACP is supported on Talvex DVSwitch only, and there is no DVSwitch co"},
        {"vswitch dvs talvex lacp stats get", 1,
         "LACP is supported on Talvex DVSwitch only, and there is no DVSwitch co"},
        {"vswitch dvs talvex lacp timeout set -t true -l 1 -s dvs-prod", 1,
         "Distributed switch 'dvs-prod' does not exist"},
        {"firewall load", 0, ""},
        {"firewall get", 0, ""},
        {"firewall set -e true -d true", 0, ""},
        {"firewall refresh", 0, ""},
        {"firewall ruleset list", 0, ""},
        {"firewall ruleset set -r webAccess -e true -a false", 0, ""},
        {"firewall ruleset client get -r webAccess", 0, ""},
        {"firewall ruleset client add -r webAccess", 0, ""},
        {"firewall ruleset client remove -r webAccess", 0, ""},
        {"firewall ruleset rule list -r sshServer", 0, ""},
        {"firewall ruleset allowedip add -r webAccess -i 192.0.2.0/24", 0, ""},
        {"firewall ruleset allowedip list -r webAccess", 0, ""},
        {"firewall ruleset allowedip remove -r webAccess -i 192.0.2.0/24", 0, ""},
        {"firewall unload", 0, ""},
        {"port stats get -p 1", 1, "Couldn't find requested port"},
        {"port filter stats get -p 1", 1, "Couldn't find requested port"},
        {"vm list", 0, ""},
        {"vm port list -w 1", 0, ""},
        {"ens maxLcores get", 1, "ENS contexts are not available on a Linux host"},
        {"ens maxLcores set -n 4", 1, "ENS contexts are not available on a Linux host"},
        {"ens lcore add -l 1", 1, "ENS contexts are not available on a Linux host"},
        {"ens lcore remove -l 1", 1, "ENS contexts are not available on a Linux host"},
        {"ens lcore list", 1, "ENS contexts are not available on a Linux host"},
        {"ens lcore switch get -l 1", 1, "ENS contexts are not available on a Linux host"},
        {"ens lcore switch add -l 1 -s vSwitch0", 1, "ENS contexts are not available on a Linux host"},
        {"ens lcore switch remove -l 1", 1, "ENS contexts are not available on a Linux host"},
        {"ens lcore affinity get -l 1", 1, "ENS contexts are not available on a Linux host"},
        {"ens lcore affinity set -l 1 -a 0", 1, "ENS contexts are not available on a Linux host"},
    };
    return lines;
}

// The lines of one text that the other lacks, marked - and +.
std::string Difference(const std::string& before, const std::string& after) {
    auto lines = [](const std::string& text) {
        std::multiset<std::string> out;
        std::size_t start = 0;
        while (start < text.size()) {
            std::size_t end = text.find('\n', start);
            if (end == std::string::npos) end = text.size();
            out.insert(text.substr(start, end - start));
            start = end + 1;
        }
        return out;
    };
    auto a = lines(before), b = lines(after);
    std::string out;
    for (const auto& line : a) {
        if (a.count(line) > b.count(line)) out += "- " + line + "\n";
    }
    for (const auto& line : b) {
        if (b.count(line) > a.count(line)) out += "+ " + line + "\n";
    }
    return out;
}

class LinuxSweepTest : public Hadro::Test::NamespaceHostTest {
protected:
    void BuildHost() {
        Configure("nics = vmnic*\n");
        Sh("sysctl -qw net.ipv6.conf.all.accept_dad=0 net.ipv6.conf.default.accept_dad=0");
        Sh("for i in 0 1 2 3; do ip link add vmnic$i type veth peer name vmnic${i}p && ip link set vmnic$i up"
           " && ip link set vmnic${i}p up || exit 1; done");
        Sh("ip link add vSwitch0 type bridge && ip link set vSwitch0 up && ip link set vmnic0 master vSwitch0"
           " && ip link add vSwitch1 type bridge && ip link set vSwitch1 up && ip link set vmnic2 master "
           "vSwitch1");
        Sh("ip link add tkn0 type veth peer name tkn0p && ip link set tkn0 up && ip link set tkn0p up"
           " && ip addr add 10.1.0.5/24 dev tkn0 && ip -6 addr add 2001:db8:1::5/64 dev tkn0 nodad"
           " && ip route add default via 10.1.0.1"
           " && ip neigh add 10.1.0.77 lladdr 02:00:00:00:00:77 dev tkn0 nud permanent");
        Sh("ip netns add glidex && ip link add tkn1 type veth peer name tkn1p && ip link set tkn1 netns "
           "glidex"
           " && ip -n glidex link set lo up && ip -n glidex link set tkn1 up"
           " && ip -n glidex addr add 10.2.0.5/24 dev tkn1");
        Sh("nft add table ip other && nft add chain ip other input '{ type filter hook input priority 0; }'"
           " && ip xfrm policy add src 2001:db8:1::/64 dst 2001:db8:3::/64 dir in action block");
    }

    // What the kernel and the host's files hold that a command may change: devices with their
    // settings, addresses, routes, queueing disciplines, nftables, xfrm, the settings of the
    // netstacks, resolv.conf, the named namespaces and the host's document. What the kernel
    // changes by itself (carrier, operational state, bridge timers) is left out.
    std::string Snapshot() {
        using nlohmann::json;
        json out;
        for (std::string ns : {"", "glidex"}) {
            const std::string ip = ns.empty() ? "ip -j" : "ip -n " + ns + " -j";
            json links = json::array();
            for (const auto& link : ShJson(ip + " -d link show")) {
                bool up = false;
                for (const auto& flag : link["flags"])
                    up |= flag == "UP";
                links.push_back(
                    {link["ifname"], link["mtu"], link.value("address", ""), link.value("master", ""), up,
                     link.value("linkinfo", json::object()).value("info_kind", ""), link.value("qdisc", "")});
            }
            json addresses = json::array();
            for (const auto& link : ShJson(ip + " addr show")) {
                for (const auto& address : link["addr_info"])
                    addresses.push_back({link["ifname"], address["local"], address["prefixlen"]});
            }
            json routes = json::array();
            for (const std::string family : {"-4", "-6"}) {
                for (const auto& route : ShJson(ip + " " + family + " route show table all"))
                    routes.push_back({route["dst"], route.value("gateway", ""), route.value("dev", ""),
                                      route.value("table", "main"), route.value("type", "unicast"),
                                      route.value("metric", 0)});
            }
            out[ns.empty() ? "default" : ns] = {links, addresses, routes};
        }
        out["qdiscs"] = ShJson("tc -j qdisc show");
        out["nftables"] = ShJson("nft -j list ruleset");
        out["files"] =
            Sh("ip xfrm policy; ip xfrm state; sysctl net.core.somaxconn net.ipv4.tcp_congestion_control"
               " net.ipv6.conf.all.disable_ipv6; cat /etc/resolv.conf; ls -d /run/netns/* /etc/netns/*"
               " 2>/dev/null; cat " +
               document_ + " 2>/dev/null; true");
        return out.dump(1);
    }
};

TEST_F(LinuxSweepTest, EveryCommandWorksOrGivesItsRefusalAndARefusalChangesNothing) {
    BuildHost();
    std::set<std::string> paths;
    for (const auto& line : Lines()) {
        const std::string before = line.status != 0 ? Snapshot() : std::string();
        auto result = Hadro(std::string("network ") + line.command);
        EXPECT_EQ(result.status, line.status) << line.command << "\n" << result.All();
        if (line.status == 0) continue;
        EXPECT_EQ(result.err.rfind(line.refusal, 0), 0u) << line.command << "\n" << result.err;
        EXPECT_EQ(result.err.find("unexpected"), std::string::npos) << line.command << "\n" << result.err;
        const std::string after = Snapshot();
        EXPECT_TRUE(after == before) << line.command << " was refused, but the host changed:\n"
                                     << Difference(before, after);
    }
}

TEST_F(LinuxSweepTest, TheSweepReachesEveryCommand) {
    std::vector<std::string> commands;
    std::string listing =
        Sh(std::string("'") + HADROCLI + "' --plugin-dir='" + HADRO_PLUGIN_DIR + "' --list-commands");
    for (std::size_t start = 0; start < listing.size();) {
        std::size_t end = listing.find('\n', start);
        std::string row = listing.substr(start, end - start);
        commands.push_back(row.substr(0, row.find('\t')));
        start = end == std::string::npos ? listing.size() : end + 1;
    }
    ASSERT_EQ(commands.size(), 143u);
    for (const auto& command : commands) {
        bool reached = false;
        for (const auto& line : Lines()) {
            const std::string text = std::string("network ") + line.command + " ";
            // The line runs this command and no longer one (whose path this one begins).
            if (text.rfind(command + " ", 0) != 0) continue;
            bool longer = false;
            for (const auto& other : commands)
                longer |= other.size() > command.size() && text.rfind(other + " ", 0) == 0;
            reached |= !longer;
        }
        EXPECT_TRUE(reached) << command << " is not in the sweep";
    }
}

// The same sweep, each line first as a dry run: it changes nothing, and ends as the real run
// does (the same status, the same refusal), but where only the kernel or a driver refuses the
// change when it is made, which a dry run does not do.
TEST_F(LinuxSweepTest, EveryCommandAsADryRunChangesNothingAndEndsAsTheRealRun) {
    const std::set<std::string> refusedWhenMade = {
        "ip ipsec sa add",      // no ESP in this kernel
        "nic pauseParams set",  // the driver (veth) has none of these
        "nic eeprom change",    // the dry run says there is no EEPROM, the driver that it cannot
        "nic negotiate restart", "nic selftest run", "nic ring current set",
    };
    BuildHost();
    for (const auto& line : Lines()) {
        const std::string before = Snapshot();
        auto dry = Hadro(std::string("--dry-run network ") + line.command);
        const std::string after = Snapshot();
        EXPECT_TRUE(after == before) << line.command << " changed the host in a dry run:\n"
                                     << Difference(before, after);
        EXPECT_EQ(dry.err.find("unexpected"), std::string::npos) << line.command << "\n" << dry.err;
        auto real = Hadro(std::string("network ") + line.command);
        const std::string command = line.command;
        const bool whenMade = std::any_of(refusedWhenMade.begin(), refusedWhenMade.end(),
                                          [&](const auto& prefix) { return command.rfind(prefix, 0) == 0; });
        if (whenMade) {
            EXPECT_EQ(real.status, 1) << line.command;
            continue;
        }
        EXPECT_EQ(dry.status, real.status) << line.command << "\n" << dry.All() << "\n" << real.All();
        if (real.status != 0) {
            EXPECT_EQ(dry.err, real.err) << line.command;
        }
    }
}

}  // namespace

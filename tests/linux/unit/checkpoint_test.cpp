// Checkpoints of the Linux host without a kernel: the files' format, and how a restore is
// planned from what the host holds and what the checkpoint says.
#include <gtest/gtest.h>
#include <linux/if_link.h>
#include <linux/neighbour.h>
#include <linux/rtnetlink.h>
#include <linux/veth.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <memory>
#include <stdexcept>

#include "core/checkpoint.h"
#include "core/restore.h"
#include "core/snapshot.h"
#include "hostctl/exception.h"
#include "kernel/bridges.h"
#include "kernel/neighbours.h"
#include "kernel/veth.h"

namespace {

using namespace TknCtl::Linux;
using Action = RestoreStep::Action;

// Values made field by field: designated initializers would leave the others unnamed.
SavedLink L(const std::string& name, const std::string& kind = "", const std::string& mac = "",
            unsigned mtu = 1500, bool up = true) {
    SavedLink link;
    link.name = name;
    link.kind = kind;
    link.mac = mac;
    link.mtu = mtu;
    link.up = up;
    return link;
}

SavedAddress A(int family, const std::string& device, const std::string& address, unsigned prefixLength,
               std::uint32_t flags = 0) {
    SavedAddress a;
    a.family = family;
    a.device = device;
    a.address = address;
    a.prefixLength = prefixLength;
    a.flags = flags;
    return a;
}

SavedRoute R(const std::string& destination, unsigned prefixLength, unsigned protocol,
             std::vector<SavedNexthop> nexthops, std::uint32_t metric = 0, unsigned scope = 0) {
    SavedRoute r;
    r.family = AF_INET;
    r.destination = destination;
    r.prefixLength = prefixLength;
    r.protocol = protocol;
    r.nexthops = std::move(nexthops);
    r.metric = metric;
    r.scope = scope;
    return r;
}

SavedPortFlags Flags(bool learning, std::optional<bool> locked) {
    SavedPortFlags flags;
    flags.learning = learning;
    flags.locked = locked;
    return flags;
}

// A host of two netstacks: a bridge with a veth port whose other end (tkn1) is in "glidex",
// an address and routes on tkn1, the firewall's table, a policy, the document.
Snapshot Host() {
    Snapshot s;
    s.taken = 1700000000;
    SavedNetstack own;
    own.name = "defaultTcpipStack";
    own.sysctls = {{"core/somaxconn", "4096"}, {"ipv6/conf/all/disable_ipv6", "0"}};
    SavedLink lo = L("lo", "", "", 65536);
    SavedLink eth = L("eth0", "", "02:00:00:00:00:10");
    SavedLink br = L("br0", "bridge", "02:00:00:00:00:20");
    br.vlanFiltering = false;
    SavedLink port = L("tkn1-port", "veth", "02:00:00:00:00:31");
    port.master = "br0";
    port.peerNetstack = "glidex";
    port.peerName = "tkn1";
    port.port = Flags(false, true);
    port.staticEntries = {"02:00:00:00:00:30"};
    port.bucket = TknCtl::Linux::Kernel::TokenBucket{125000, 32768, 0, 0, 40000};
    port.acceptRa = "0";
    port.disableIpv6 = "1";
    own.links = {lo, eth, br, port};
    own.addresses = {A(AF_INET, "eth0", "192.0.2.10", 24)};
    own.routes = {R("192.0.2.0", 24, 2, {{"", "eth0"}}, 0, 253), R("0.0.0.0", 0, 4, {{"192.0.2.1", "eth0"}})};
    own.routes[0].preferredSource = "192.0.2.10";
    own.neighbours = {SavedNeighbour{AF_INET, "eth0", "192.0.2.1", "02:00:00:00:00:01", 0}};
    own.resolvConf = "nameserver 192.0.2.53\n";

    SavedNetstack glidex;
    glidex.name = "glidex";
    glidex.hasFiles = true;
    SavedLink tkn = L("tkn1", "veth", "02:00:00:00:00:30", 9000);
    tkn.peerNetstack = "defaultTcpipStack";
    tkn.peerName = "tkn1-port";
    tkn.rxQueues = 4;
    glidex.links = {L("lo", "", "", 65536), tkn};
    glidex.addresses = {A(AF_INET, "tkn1", "10.1.0.1", 24), A(AF_INET, "tkn1", "10.1.0.9", 24),
                        A(AF_INET6, "tkn1", "2001:db8::1", 64), A(AF_INET6, "tkn1", "2001:db8::2", 64)};
    glidex.routes = {R("10.1.0.0", 24, 2, {{"", "tkn1"}}, 0, 253),
                     R("10.9.0.0", 16, 4, {{"10.1.0.254", "tkn1"}}, 5)};
    s.netstacks = {own, glidex};
    s.netstackFiles = true;
    s.firewall = R"([{"table":{"family":"inet","name":"hadro"}}])";
    SavedPolicy policy;
    policy.selector.destination = "2001:db8::";
    policy.selector.destinationPrefix = 32;
    policy.templates = {TknCtl::Linux::Kernel::XfrmTemplate{}};
    s.policies = {policy};
    s.states = {SavedState{AF_INET6, "2001:db8::1", "2001:db8::2", 0x100, 50}};
    s.document = "{\"version\":1}\n";
    return s;
}

SavedNetstack& Netstack(Snapshot& s, const std::string& name) {
    for (auto& n : s.netstacks) {
        if (n.name == name) return n;
    }
    throw std::logic_error("no netstack " + name);
}

SavedLink& Link(Snapshot& s, const std::string& netstack, const std::string& name) {
    for (auto& link : Netstack(s, netstack).links) {
        if (link.name == name) return link;
    }
    throw std::logic_error("no link " + name);
}

std::vector<std::string> Plan(const Snapshot& live, const Snapshot& wanted, RestorePhase phase) {
    std::vector<std::string> out;
    for (const auto& step : PlanRestore(live, wanted, phase))
        out.push_back(step.Describe());
    return out;
}

std::string Refusal(std::string_view text) {
    try {
        SnapshotFromJson(text);
    } catch (const std::invalid_argument& e) {
        return e.what();
    }
    return {};
}

// ---------------------------------------------------------------- the files

TEST(CheckpointFiles, SnapshotsComeBackAsTheyWereWritten) {
    Snapshot s = Host();
    EXPECT_EQ(SnapshotFromJson(SnapshotToJson(s)), s);
    // Expiring addresses keep their lifetimes, a host without nftables says so.
    Netstack(s, "glidex").addresses[0].permanent = false;
    Netstack(s, "glidex").addresses[0].validLifetime = 300;
    s.firewallKnown = false;
    s.firewall.reset();
    s.document.reset();
    Netstack(s, "defaultTcpipStack").resolvConf.reset();
    EXPECT_EQ(SnapshotFromJson(SnapshotToJson(s)), s);
    EXPECT_EQ(SnapshotToJson(s).find("\"key\""), std::string::npos);
}

TEST(CheckpointFiles, DamagedSnapshotsAreRefusedSayingWhere) {
    const std::string good = SnapshotToJson(Host());
    auto with = [&](const std::string& from, const std::string& to) {
        std::string text = good;
        auto at = text.find(from);
        EXPECT_NE(at, std::string::npos) << from;
        return text.replace(at, from.size(), to);
    };
    EXPECT_EQ(Refusal("{"), "the snapshot is not valid JSON");
    EXPECT_EQ(Refusal("[]"), "the snapshot is not an object");
    EXPECT_EQ(Refusal(with("\"version\": 1", "\"version\": 2")), "the snapshot is not of version 1");
    EXPECT_EQ(Refusal(with("\"taken\"", "\"took\"")), "the snapshot has no member \"taken\"");
    EXPECT_EQ(Refusal(with("\"mtu\": 65536", "\"mtu\": \"big\"")),
              "netstacks[0].links[0].mtu is not a number from 0 to 4294967295");
    EXPECT_EQ(Refusal(with("\"up\": true", "\"up\": 1")), "netstacks[0].links[0].up is not true or false");
    EXPECT_EQ(Refusal(with("\"hasFiles\": false", "\"hasFiles\": false, \"extra\": 1")),
              "netstacks[0] has an unknown member \"extra\"");
    EXPECT_EQ(Refusal(with("\"core/somaxconn\"", "\"core/rmem_max\"")),
              "netstacks[0] has a sysctl core/rmem_max that a snapshot does not keep");
    EXPECT_EQ(Refusal(with("\"name\": \"glidex\"", "\"name\": \"../etc\"")),
              "netstacks[1] has a netstack named \"../etc\", which no namespace can be");
    EXPECT_EQ(Refusal(with("\"name\": \"defaultTcpipStack\"", "\"name\": \"other\"")),
              "the snapshot does not start with the default netstack");
    EXPECT_EQ(Refusal(with("\"family\": 2", "\"family\": 7")),
              "netstacks[0].addresses[0] has a \"family\" of no address family");
}

TEST(CheckpointFiles, PendingCheckpointsAndTheirRefusals) {
    PendingCheckpoint pending;
    pending.taken = 1700000000;
    pending.deadline = 1700000030;
    pending.deadlineBoot = 123456;
    pending.owner = {4242, 987654, "0b8c5f1e-0000-4000-8000-000000000000"};
    auto back = PendingFromJson(PendingToJson(pending));
    EXPECT_EQ(back.taken, pending.taken);
    EXPECT_EQ(back.deadline, pending.deadline);
    EXPECT_EQ(back.deadlineBoot, pending.deadlineBoot);
    EXPECT_EQ(back.owner, pending.owner);
    pending.deadline.reset();  // an atomic batch's: no deadline
    pending.deadlineBoot.reset();
    EXPECT_FALSE(PendingFromJson(PendingToJson(pending)).deadline);

    auto refusal = [](std::string_view text) {
        try {
            PendingFromJson(text);
        } catch (const std::invalid_argument& e) {
            return std::string(e.what());
        }
        return std::string();
    };
    EXPECT_EQ(refusal("nothing"), "not a JSON object");
    EXPECT_EQ(refusal(R"({"version":2})"), "not of version 1");
    EXPECT_EQ(refusal(R"({"version":1,"taken":1,"deadline":null,"deadlineBoot":null})"), "no \"owner\"");
    EXPECT_EQ(refusal(R"({"version":1,"taken":1,"deadline":null,"deadlineBoot":null,"owner":{}})"),
              "no \"pid\"");
    EXPECT_EQ(refusal(R"({"version":1,"taken":1,"deadline":null,"deadlineBoot":null,
                          "owner":{"pid":0,"start":1,"boot":"b"}})"),
              "\"pid\" is no process ID");
    EXPECT_EQ(refusal(R"({"version":1,"taken":"now"})"), "\"taken\" is no integer");
    EXPECT_EQ(refusal(R"({"version":1,"more":1})"), "unknown member \"more\"");
}

TEST(CheckpointFiles, ProcessesAreToldApartByStartTimeAndBoot) {
    auto self = ProcessIdentity::Of(getpid());
    ASSERT_TRUE(self);
    EXPECT_TRUE(self->Alive());
    EXPECT_FALSE(self->boot.empty());
    auto earlier = *self;
    earlier.start -= 1;  // the same PID, another process
    EXPECT_FALSE(earlier.Alive());
    auto otherBoot = *self;
    otherBoot.boot = "another boot";
    EXPECT_FALSE(otherBoot.Alive());
    pid_t child = fork();
    if (child == 0) _exit(0);
    auto identity = ProcessIdentity::Of(child);
    int status = 0;
    waitpid(child, &status, 0);
    if (identity) {
        EXPECT_FALSE(identity->Alive());
    }
    EXPECT_FALSE(ProcessIdentity::Of(-1));
}

TEST(CheckpointFiles, FirewallListingsLoseTheirHandles) {
    EXPECT_EQ(FirewallObjects(R"({"nftables":[{"metainfo":{"version":"1.0.6"}},
        {"table":{"family":"inet","name":"hadro","handle":7}},
        {"rule":{"family":"inet","table":"hadro","chain":"input","handle":4,"expr":[{"accept":null}]}}]})"),
              R"([{"table":{"family":"inet","name":"hadro"}},)"
              R"({"rule":{"chain":"input","expr":[{"accept":null}],"family":"inet","table":"hadro"}}])");
}

// ---------------------------------------------------------------- planning a restore

TEST(RestorePlan, AHostAsItsCheckpointSaysNeedsNothing) {
    EXPECT_TRUE(Differences(Host(), Host()).empty());
    // Run-time state is no difference: an address's lifetime running down.
    Snapshot live = Host(), wanted = Host();
    Netstack(wanted, "glidex").addresses[0].permanent = false;
    Netstack(wanted, "glidex").addresses[0].validLifetime = 300;
    Netstack(live, "glidex").addresses[0].permanent = false;
    Netstack(live, "glidex").addresses[0].validLifetime = 120;
    EXPECT_TRUE(Differences(live, wanted).empty());
}

TEST(RestorePlan, NetstacksComeAndGoWithTheirFiles) {
    Snapshot live = Host(), wanted = Host();
    Netstack(live, "glidex").hasFiles = false;
    SavedNetstack added;
    added.name = "lab";
    live.netstacks.push_back(added);
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kNetstacks),
              (std::vector<std::string>{"remove netstack lab", "make /etc/netns/glidex"}));
    live.netstacks.erase(live.netstacks.begin() + 1);  // glidex was removed
    EXPECT_EQ(
        Plan(live, wanted, RestorePhase::kNetstacks),
        (std::vector<std::string>{"remove netstack lab", "make netstack glidex", "make /etc/netns/glidex"}));
}

TEST(RestorePlan, LinksTheHostMakesAreRemovedAndMadeAgain) {
    Snapshot wanted = Host();
    // New: a bridge, a veth pair between the netstacks (removed once), a device of another
    // kind and a veth whose other end is in a namespace of someone else (both left alone).
    Snapshot live = Host();
    Netstack(live, "defaultTcpipStack").links.push_back(L("br9", "bridge"));
    auto pair = Link(live, "glidex", "tkn1");
    pair.name = "tkn2";
    pair.peerName = "tkn2-port";
    Netstack(live, "glidex").links.push_back(pair);
    auto port = Link(live, "defaultTcpipStack", "tkn1-port");
    port.name = "tkn2-port";
    port.peerName = "tkn2";
    Netstack(live, "defaultTcpipStack").links.push_back(port);
    Netstack(live, "defaultTcpipStack").links.push_back(L("tap0", "tun"));
    Netstack(live, "defaultTcpipStack").links.push_back(L("vethc", "veth"));
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kLinks),
              (std::vector<std::string>{"remove device br9", "remove device tkn2-port"}));

    // Gone: the pair is made once, with both ends in their netstacks; a NIC cannot be made.
    live = Host();
    auto& own = Netstack(live, "defaultTcpipStack").links;
    own.erase(std::remove_if(own.begin(), own.end(),
                             [](const SavedLink& l) { return l.name == "tkn1-port" || l.name == "eth0"; }),
              own.end());
    Netstack(live, "glidex").links.pop_back();
    auto steps = PlanRestore(live, wanted, RestorePhase::kLinks);
    ASSERT_EQ(steps.size(), 2u);
    EXPECT_EQ(steps[0].action, Action::kCannot);
    EXPECT_EQ(steps[0].Describe(), "device eth0 is gone and cannot be made again");
    EXPECT_EQ(steps[1].action, Action::kAddVeth);
    EXPECT_EQ(steps[1].Describe(), "make veth pair tkn1-port / tkn1 (netstack glidex)");
    EXPECT_EQ(steps[1].link->mac, "02:00:00:00:00:31");
    EXPECT_EQ(steps[1].peer->rxQueues, 4u);
    EXPECT_EQ(steps[1].peerNetstack, "glidex");

    // A veth of the same name joined to another end is made again; so is a bridge that went.
    live = Host();
    Link(live, "defaultTcpipStack", "tkn1-port").peerName = "tkn7";
    Link(live, "defaultTcpipStack", "br0").kind = "veth";
    Link(live, "defaultTcpipStack", "br0").peerNetstack = "glidex";
    Link(live, "defaultTcpipStack", "br0").peerName = "x";
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kLinks),
              (std::vector<std::string>{"remove device br0", "remove device tkn1-port", "make bridge br0",
                                        "make veth pair tkn1-port / tkn1 (netstack glidex)"}));

    // A device made anew under its name gets the index it had, when no other device holds it.
    wanted = Host();
    Link(wanted, "defaultTcpipStack", "br0").index = 4;
    Link(wanted, "defaultTcpipStack", "eth0").index = 2;
    live = wanted;
    Link(live, "defaultTcpipStack", "br0").index = 9;
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kLinks),
              (std::vector<std::string>{"remove device br0", "make bridge br0"}));
    EXPECT_EQ(PlanRestore(live, wanted, RestorePhase::kLinks)[1].link->index, 4);
    Link(live, "defaultTcpipStack", "eth0").index = 4;
    EXPECT_TRUE(Plan(live, wanted, RestorePhase::kLinks).empty());
}

TEST(RestorePlan, LinkSettingsInTheirOrderAndOnlyWhatTheKernelHas) {
    Snapshot wanted = Host();
    Snapshot live = Host();
    Netstack(live, "defaultTcpipStack").sysctls["ipv6/conf/all/disable_ipv6"] = "1";
    auto& port = Link(live, "defaultTcpipStack", "tkn1-port");
    port.up = false;
    port.mtu = 1400;
    port.mac = "02:00:00:00:00:99";
    port.bucket.reset();
    port.acceptRa = "2";
    port.staticEntries = {"02:00:00:00:00:77"};
    auto& br = Link(live, "defaultTcpipStack", "br0");
    br.vlanFiltering = true;
    Link(live, "glidex", "tkn1").up = false;
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kLinkSettings),
              (std::vector<std::string>{
                  "set net.ipv6/conf/all/disable_ipv6 to 0", "set the MTU of tkn1-port to 1500",
                  "set the MAC address of tkn1-port to 02:00:00:00:00:31", "turn VLAN filtering off on br0",
                  "remove the static forwarding entry 02:00:00:00:00:77 on tkn1-port",
                  "add the static forwarding entry 02:00:00:00:00:30 on tkn1-port",
                  "put the token bucket back on tkn1-port", "set net.ipv6/conf/tkn1-port/accept_ra to 0",
                  "bring tkn1-port up", "bring tkn1 up (netstack glidex)"}));

    // A port out of its bridge joins it first; its flags and entries wait until it is one.
    live = Host();
    Link(live, "defaultTcpipStack", "tkn1-port").master.clear();
    Link(live, "defaultTcpipStack", "tkn1-port").port.reset();
    Link(live, "defaultTcpipStack", "tkn1-port").staticEntries.clear();
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kLinkSettings),
              (std::vector<std::string>{"make tkn1-port a port of br0"}));
    // Port flags; locked only where the kernel has locked ports.
    live = Host();
    Link(live, "defaultTcpipStack", "tkn1-port").port->learning = true;
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kLinkSettings),
              (std::vector<std::string>{"set the port flags of tkn1-port"}));
    live = Host();
    Link(live, "defaultTcpipStack", "tkn1-port").port->locked.reset();
    EXPECT_TRUE(Plan(live, wanted, RestorePhase::kLinkSettings).empty());
    // A bucket that is not in the checkpoint goes.
    live = Host();
    Link(live, "defaultTcpipStack", "br0").bucket = TknCtl::Linux::Kernel::TokenBucket{1, 2, 0, 0, 3};
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kLinkSettings),
              (std::vector<std::string>{"remove the token bucket of br0"}));
}

TEST(RestorePlan, AddressesInTheKernelsOrder) {
    const Snapshot wanted = Host();
    // Only added: the new ones go, the others stay.
    Snapshot live = Host();
    Netstack(live, "glidex").addresses.push_back(A(AF_INET, "tkn1", "10.1.0.77", 24));
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kAddresses),
              (std::vector<std::string>{"remove address 10.1.0.77/24 from tkn1 (netstack glidex)"}));
    // One went: IPv4 is made again in order (secondaries removed before their primary).
    live = Host();
    auto& addresses = Netstack(live, "glidex").addresses;
    addresses.erase(addresses.begin());
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kAddresses),
              (std::vector<std::string>{"remove address 10.1.0.9/24 from tkn1 (netstack glidex)",
                                        "add address 10.1.0.1/24 to tkn1 (netstack glidex)",
                                        "add address 10.1.0.9/24 to tkn1 (netstack glidex)"}));
    // IPv6 lists the newest first: made again from the last.
    live = Host();
    Netstack(live, "glidex").addresses.pop_back();
    Netstack(live, "glidex").addresses.push_back(A(AF_INET6, "tkn1", "2001:db8::2", 64, 0x200));
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kAddresses),
              (std::vector<std::string>{"remove address 2001:db8::2/64 from tkn1 (netstack glidex)",
                                        "remove address 2001:db8::1/64 from tkn1 (netstack glidex)",
                                        "add address 2001:db8::2/64 to tkn1 (netstack glidex)",
                                        "add address 2001:db8::1/64 to tkn1 (netstack glidex)"}));
}

TEST(RestorePlan, RoutesAndNeighbours) {
    const Snapshot wanted = Host();
    // An address removal took the routes through it: the device's route comes before the
    // gateway's; a new route goes; routes of devices the checkpoint does not know stay.
    Snapshot live = Host();
    auto& routes = Netstack(live, "glidex").routes;
    routes.clear();
    routes.push_back(R("10.7.0.0", 16, 4, {{"10.1.0.254", "tkn1"}}));
    routes.push_back(R("10.8.0.0", 16, 4, {{"", "tap0"}}));
    std::reverse(Netstack(live, "glidex").routes.begin(), Netstack(live, "glidex").routes.end());
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kRoutes),
              (std::vector<std::string>{
                  "remove route 10.7.0.0/16 via 10.1.0.254 dev tkn1 (netstack glidex)",
                  "add route 10.1.0.0/24 dev tkn1 (netstack glidex)",
                  "add route 10.9.0.0/16 via 10.1.0.254 dev tkn1 metric 5 (netstack glidex)"}));
    // A route that changed its protocol or metric is made again.
    live = Host();
    Netstack(live, "defaultTcpipStack").routes[1].protocol = 16;
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kRoutes),
              (std::vector<std::string>{"remove route default via 192.0.2.1 dev eth0",
                                        "add route default via 192.0.2.1 dev eth0"}));
    // Permanent neighbours: a new one goes; when one went, the table is made again, the newest
    // (listed first) last.
    live = Host();
    Netstack(live, "defaultTcpipStack")
        .neighbours.push_back({AF_INET, "eth0", "192.0.2.99", "02:00:00:00:00:99", 0});
    EXPECT_EQ(Plan(live, wanted, RestorePhase::kRoutes),
              (std::vector<std::string>{"remove neighbour 192.0.2.99 on eth0"}));
    Snapshot two = Host();
    Netstack(two, "defaultTcpipStack")
        .neighbours.push_back({AF_INET, "eth0", "192.0.2.2", "02:00:00:00:00:02", 0});
    live = Host();
    Netstack(live, "defaultTcpipStack").neighbours = {{AF_INET, "eth0", "192.0.2.2", "02:00:00:00:00:02", 0}};
    EXPECT_EQ(
        Plan(live, two, RestorePhase::kRoutes),
        (std::vector<std::string>{"remove neighbour 192.0.2.2 on eth0", "add neighbour 192.0.2.2 on eth0",
                                  "add neighbour 192.0.2.1 on eth0"}));
}

TEST(RestorePlan, FirewallXfrmFilesAndTheDocument) {
    const Snapshot wanted = Host();
    Snapshot live = Host();
    live.firewall.reset();
    live.policies.clear();
    live.policies.push_back(wanted.policies[0]);
    live.policies[0].action = 1;
    live.states.push_back(SavedState{AF_INET6, "2001:db8::1", "2001:db8::3", 0x200, 50});
    live.states.erase(live.states.begin());
    Netstack(live, "defaultTcpipStack").resolvConf = "nameserver 10.0.0.1\n";
    Netstack(live, "glidex").resolvConf = "nameserver 10.0.0.2\n";
    live.document = "{\"version\":1,\"tags\":{}}\n";
    EXPECT_EQ(
        Plan(live, wanted, RestorePhase::kRest),
        (std::vector<std::string>{
            "put the firewall's nftables table back", "remove xfrm policy ::/0 to 2001:db8::/32 dir out",
            "add xfrm policy ::/0 to 2001:db8::/32 dir out",
            "remove IPsec security association 0x200 to 2001:db8::3",
            "IPsec security association 0x100 to 2001:db8::2 cannot be made again: the kernel never "
            "gives its keys back",
            "write /etc/resolv.conf", "remove /etc/netns/glidex/resolv.conf", "write the host's document"}));

    // What the checkpoint could not read, and a resolver daemon's file, are left alone; a table
    // and a document that were not there go.
    Snapshot without = Host();
    without.firewall.reset();
    without.document.reset();
    live = Host();
    EXPECT_EQ(
        Plan(live, without, RestorePhase::kRest),
        (std::vector<std::string>{"remove the firewall's nftables table", "remove the host's document"}));
    without.netstackFiles = false;
    EXPECT_EQ(Plan(live, without, RestorePhase::kRest).front(), "remove /etc/netns");
    without.netstackFiles = true;
    without.firewallKnown = false;
    Netstack(without, "defaultTcpipStack").resolvManaged = true;
    Netstack(live, "defaultTcpipStack").resolvConf = "changed by the daemon\n";
    EXPECT_EQ(Plan(live, without, RestorePhase::kRest),
              (std::vector<std::string>{"remove the host's document"}));
}

// ---------------------------------------------------------------- requests a restore makes

using Message = std::unique_ptr<nl_msg, void (*)(nl_msg*)>;
namespace Kernel = TknCtl::Linux::Kernel;

TEST(RestoreRequests, DevicesAreMadeAgainWithTheirIndexes) {
    Message bridge(Kernel::BuildBridgeAdd("br7", 1500, 12), nlmsg_free);
    EXPECT_EQ(static_cast<const ifinfomsg*>(nlmsg_data(nlmsg_hdr(bridge.get())))->ifi_index, 12);
    Kernel::VethPair pair;
    pair.end.name = "tkn1-port";
    pair.end.index = 8;
    pair.peer.name = "tkn1";
    pair.peer.index = 7;
    Message veth(Kernel::BuildVethAdd(pair, -1), nlmsg_free);
    nlmsghdr* header = nlmsg_hdr(veth.get());
    EXPECT_EQ(static_cast<const ifinfomsg*>(nlmsg_data(header))->ifi_index, 8);
    nlattr* at[IFLA_MAX + 1] = {};
    ASSERT_EQ(nlmsg_parse(header, sizeof(ifinfomsg), at, IFLA_MAX, nullptr), 0);
    nlattr* info[IFLA_INFO_MAX + 1] = {};
    nla_parse_nested(info, IFLA_INFO_MAX, at[IFLA_LINKINFO], nullptr);
    nlattr* data[VETH_INFO_MAX + 1] = {};
    nla_parse_nested(data, VETH_INFO_MAX, info[IFLA_INFO_DATA], nullptr);
    ASSERT_TRUE(data[VETH_INFO_PEER]);
    EXPECT_EQ(static_cast<const ifinfomsg*>(nla_data(data[VETH_INFO_PEER]))->ifi_index, 7);
}

TEST(RestoreRequests, APermanentNeighbourIsAddedWithItsLinkLayerAddress) {
    Kernel::Neighbour entry;
    entry.family = AF_INET6;
    entry.index = 4;
    entry.address = "2001:db8::7";
    entry.linkLayer = "02:00:00:00:0a:0B";
    entry.state = NUD_PERMANENT;
    entry.flags = NTF_ROUTER;
    Message message(Kernel::BuildNeighbourAdd(entry), nlmsg_free);
    nlmsghdr* header = nlmsg_hdr(message.get());
    EXPECT_EQ(header->nlmsg_type, RTM_NEWNEIGH);
    EXPECT_EQ(header->nlmsg_flags & (NLM_F_CREATE | NLM_F_REPLACE), NLM_F_CREATE | NLM_F_REPLACE);
    const auto* info = static_cast<const ndmsg*>(nlmsg_data(header));
    EXPECT_EQ(info->ndm_ifindex, 4);
    EXPECT_EQ(info->ndm_state, NUD_PERMANENT);
    EXPECT_EQ(info->ndm_flags, NTF_ROUTER);
    nlattr* at[NDA_MAX + 1] = {};
    ASSERT_EQ(nlmsg_parse(header, sizeof(ndmsg), at, NDA_MAX, nullptr), 0);
    ASSERT_TRUE(at[NDA_LLADDR]);
    const unsigned char mac[] = {0x02, 0, 0, 0, 0x0a, 0x0b};
    ASSERT_EQ(nla_len(at[NDA_LLADDR]), 6);
    EXPECT_EQ(std::memcmp(nla_data(at[NDA_LLADDR]), mac, 6), 0);
    EXPECT_EQ(nla_len(at[NDA_DST]), 16);

    auto refusal = [&](const std::string& linkLayer, const std::string& address) {
        entry.linkLayer = linkLayer;
        entry.address = address;
        try {
            Message never(Kernel::BuildNeighbourAdd(entry), nlmsg_free);
        } catch (const HostCtl::Lib::HostCtlException& e) {
            return std::string(e.what());
        }
        return std::string();
    };
    EXPECT_EQ(refusal("02:00:0", "2001:db8::7"), "Invalid link-layer address '02:00:0'");
    EXPECT_EQ(refusal("02-00-00", "2001:db8::7"), "Invalid link-layer address '02-00-00'");
    EXPECT_EQ(refusal("zz:00", "2001:db8::7"), "Invalid link-layer address 'zz:00'");
    EXPECT_EQ(refusal("02:00", "10.0.0.1"), "Invalid neighbour address '10.0.0.1'");
}

}  // namespace

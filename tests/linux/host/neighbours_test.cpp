// Neighbours of the Linux host: "network ip neighbor ..." against what ip neigh says of the
// test's own namespaces.
#include "namespace_host.h"

namespace {

using nlohmann::json;

json Entry(const json& list, const std::string& address) {
    for (const auto& record : list) {
        if (record["Neighbor"] == address) return record;
    }
    return json();
}

class NeighboursTest : public Hadro::Test::NamespaceHostTest {
protected:
    // a0 and b0, each with a peer; entries of each kind on them; netstack glidex with one of its own.
    void Build() {
        Sh("ip link add a0 type veth peer name a1 && ip link set a0 up && ip link set a1 up"
           " && ip addr add 10.1.0.1/24 dev a0"
           " && ip link add b0 type veth peer name b1 && ip link set b0 up && ip link set b1 up"
           " && ip addr add 10.4.0.1/24 dev b0"
           " && ip neigh add 10.1.0.50 lladdr 02:00:00:00:00:50 dev a0 nud permanent"
           " && ip neigh add 10.1.0.51 lladdr 02:00:00:00:00:51 dev a0 nud reachable"
           " && ip neigh add 10.1.0.52 lladdr 02:00:00:00:00:52 dev a0 nud stale"
           " && ip neigh add 10.1.0.50 lladdr 02:00:00:00:01:50 dev b0 nud permanent"
           " && ip netns add glidex && ip link add g0 type veth peer name g1 netns glidex"
           " && ip -n glidex link set g1 up"
           " && ip -n glidex neigh add 10.9.0.5 lladdr 02:00:00:00:09:05 dev g1 nud permanent");
    }
};

TEST_F(NeighboursTest, Ipv4EntriesAreTheKernelsWithTheirTypeAndWhatIsLeftOfTheirState) {
    Build();
    auto list = HadroJson("network ip neighbor list -v 4");
    auto kernel = ShJson("ip -j -4 neigh show");
    ASSERT_EQ(list.size(), kernel.size()) << list;
    for (std::size_t i = 0; i < kernel.size(); ++i) {
        EXPECT_EQ(list[i]["Neighbor"], kernel[i]["dst"]);
        EXPECT_EQ(list[i]["Mac Address"], kernel[i]["lladdr"]);
        EXPECT_EQ(list[i]["Tknnic"], kernel[i]["dev"]);
        EXPECT_EQ(list[i]["State"], "");
    }
    EXPECT_EQ(Entry(list, "10.1.0.51")["Type"], "Dynamic");
    // Reachable for up to 1.5 times base_reachable_time (30 s); stale until gc_stale_time (60 s).
    EXPECT_GT(Entry(list, "10.1.0.51")["Expiry"], 0);
    EXPECT_LE(Entry(list, "10.1.0.51")["Expiry"], 45);
    EXPECT_GT(Entry(list, "10.1.0.52")["Expiry"], 50);
    EXPECT_LE(Entry(list, "10.1.0.52")["Expiry"], 60);
    EXPECT_EQ(Entry(list, "10.1.0.50")["Type"], "Static");
    EXPECT_EQ(Entry(list, "10.1.0.50")["Expiry"], 0);

    auto onB0 = HadroJson("network ip neighbor list -v 4 -i b0");
    ASSERT_EQ(onB0.size(), 1u);
    EXPECT_EQ(onB0[0]["Mac Address"], "02:00:00:00:01:50");
    auto glidex = HadroJson("network ip neighbor list -v 4 -N glidex");
    ASSERT_EQ(glidex.size(), 1u);
    EXPECT_EQ(glidex[0]["Neighbor"], "10.9.0.5");
    EXPECT_EQ(glidex[0]["Tknnic"], "g1");
    // Listing keeps to its netstack: an interface of another one has no entries there.
    EXPECT_TRUE(HadroJson("network ip neighbor list -v 4 -i g1").empty());
    EXPECT_EQ(Hadro("network ip neighbor list -v 4 -i nosuch").err,
              "Unable to find a Tarkon interface with the name nosuch\n");
    EXPECT_EQ(Hadro("network ip neighbor list -v 4 -N nowhere").err,
              "Netstack instance 'nowhere' does not exist\n");
}

TEST_F(NeighboursTest, AnEntryGoesFromOneInterfaceOrFromAll) {
    Build();
    EXPECT_EQ(Hadro("network ip neighbor remove -v 4 -a 10.1.0.50 -i b0").status, 0);
    EXPECT_TRUE(ShJson("ip -j neigh show 10.1.0.50 dev b0").empty());
    EXPECT_EQ(ShJson("ip -j neigh show 10.1.0.50 dev a0").size(), 1u);
    Sh("ip neigh add 10.1.0.50 lladdr 02:00:00:00:01:50 dev b0 nud permanent");
    EXPECT_EQ(Hadro("network ip neighbor remove -v 4 -a 10.1.0.50").status, 0);
    EXPECT_TRUE(ShJson("ip -j neigh show 10.1.0.50").empty());

    EXPECT_EQ(Hadro("network ip neighbor remove -v 4 -a 10.1.0.50").err,
              "No neighbour entry for 10.1.0.50 on netstack 'defaultTcpipStack'\n");
    EXPECT_EQ(Hadro("network ip neighbor remove -v 4 -a 10.1.0.51 -i b0").err,
              "No neighbour entry for 10.1.0.51 on b0\n");
    // The interface's netstack is the one meant, whatever --netstack says.
    EXPECT_EQ(Hadro("network ip neighbor remove -v 4 -a 10.9.0.5 -i g1").status, 0);
    EXPECT_TRUE(ShJson("ip -n glidex -j neigh show").empty());

    auto refused = HadroUnprivileged("network ip neighbor remove -v 4 -a 10.1.0.51");
    EXPECT_EQ(refused.status, 1);
    EXPECT_EQ(refused.err, "Changing the host's network needs root (CAP_NET_ADMIN)\n");
    EXPECT_EQ(ShJson("ip -j neigh show 10.1.0.51").size(), 1u);
    EXPECT_EQ(HadroUnprivileged("network ip neighbor list -v 4").status, 0);
}

TEST_F(NeighboursTest, Ipv6EntriesShowTheirStateAndRouters) {
    Build();
    Sh("ip -6 neigh add 2001:db8::9 lladdr 02:00:00:00:00:09 dev a0 router nud reachable"
       " && ip -6 neigh add 2001:db8::a lladdr 02:00:00:00:00:0a dev a0 nud stale");
    // The kernel's own entries of multicast groups (NOARP) are no neighbours: ip leaves them out too.
    EXPECT_EQ(HadroJson("network ip neighbor list -v 6").size(), ShJson("ip -j -6 neigh show").size());
    auto list = HadroJson("network ip neighbor list -v 6 -i a0");
    EXPECT_EQ(Entry(list, "2001:db8::9")["Type"], "Router");
    EXPECT_EQ(Entry(list, "2001:db8::9")["State"], "Reachable");
    EXPECT_EQ(Entry(list, "2001:db8::a")["Type"], "Dynamic");
    EXPECT_EQ(Entry(list, "2001:db8::a")["State"], "Stale");
    EXPECT_EQ(Hadro("network ip neighbor remove -v 6 -a 2001:db8::9").status, 0);
    EXPECT_TRUE(ShJson("ip -j -6 neigh show 2001:db8::9").empty());
}

}  // namespace

// The Linux host's global IP settings: "network ip get" reads the IPv6 switch of the default
// netstack, "network ip set" switches IPv6 in every netstack (net.ipv6.conf.{all,default}.
// disable_ipv6 of each namespace). `sysctl` and `ip` are the oracle.
#include "namespace_host.h"

namespace {

using nlohmann::json;

class IpSettingsTest : public Hadro::Test::NamespaceHostTest {
protected:
    // disable_ipv6 of all and default in a namespace (the test's own for an empty name): "0 0".
    std::string DisableIpv6(const std::string& netns = {}) {
        std::string prefix = netns.empty() ? "" : "ip netns exec " + netns + " ";
        std::string value = Sh(prefix +
                               "sysctl -n net.ipv6.conf.all.disable_ipv6 net.ipv6.conf.default.disable_ipv6"
                               " | tr '\\n' ' '");
        return value.substr(0, value.size() - 1);
    }
};

TEST_F(IpSettingsTest, GetReadsTheDefaultNetstack) {
    EXPECT_EQ(HadroJson("network ip get"), json::parse(R"({"IPv6 Enabled": true})"));
    Sh("sysctl -qw net.ipv6.conf.default.disable_ipv6=1");
    EXPECT_EQ(HadroJson("network ip get")["IPv6 Enabled"], false);  // new interfaces would have none
    Sh("sysctl -qw net.ipv6.conf.default.disable_ipv6=0 net.ipv6.conf.all.disable_ipv6=1");
    EXPECT_EQ(Hadro("network ip get").out, "IPv6 Enabled: false\n");
    // A named netstack's own switch is its own.
    Sh("sysctl -qw net.ipv6.conf.all.disable_ipv6=0 && ip netns add blue && "
       "ip netns exec blue sysctl -qw net.ipv6.conf.all.disable_ipv6=1");
    EXPECT_EQ(HadroJson("network ip get")["IPv6 Enabled"], true);
    EXPECT_EQ(HadroUnprivileged("network ip get").out, "IPv6 Enabled: true\n");
}

TEST_F(IpSettingsTest, SetSwitchesIpv6InEveryNetstack) {
    Sh("ip netns add blue && ip netns add amber && ip netns exec amber sysctl -qw "
       "net.ipv6.conf.all.disable_ipv6=1");
    Sh("ip link add v0 type veth peer name v1 && ip link set v0 up");
    EXPECT_EQ(Hadro("network ip set --ipv6-enabled false").status, 0);
    EXPECT_EQ(DisableIpv6(), "1 1");
    EXPECT_EQ(DisableIpv6("blue"), "1 1");
    EXPECT_EQ(DisableIpv6("amber"), "1 1");
    EXPECT_EQ(Sh("sysctl -n net.ipv6.conf.v0.disable_ipv6"), "1\n");  // interfaces there go with it
    EXPECT_EQ(Sh("ip -6 -br addr show dev v0"), "");
    EXPECT_EQ(HadroJson("network ip get")["IPv6 Enabled"], false);

    EXPECT_EQ(Hadro("network ip set -e true").status, 0);
    EXPECT_EQ(DisableIpv6(), "0 0");
    EXPECT_EQ(DisableIpv6("blue"), "0 0");
    EXPECT_EQ(DisableIpv6("amber"), "0 0");
    EXPECT_EQ(HadroJson("network ip netstack get -N amber")[0]["IPv6 Enabled"], true);
    EXPECT_EQ(HadroJson("network ip get")["IPv6 Enabled"], true);
    // Nothing asked: nothing changed, and true.
    EXPECT_EQ(Hadro("network ip set").status, 0);
}

TEST_F(IpSettingsTest, SetNeedsRoot) {
    auto refused = HadroUnprivileged("network ip set -e false");
    EXPECT_EQ(refused.status, 1);
    EXPECT_EQ(refused.err, "Changing the host's network needs root (CAP_NET_ADMIN)\n");
    EXPECT_EQ(DisableIpv6(), "0 0");
}

}  // namespace

// Netstacks of the Linux host: the namespace hadrocli runs in and the named namespaces of
// /run/netns, their somaxconn, congestion-control and IPv6 sysctls, and the netstacks kept
// disabled in the host's document. `ip netns` and `sysctl` are the oracle.
#include <sys/stat.h>

#include <filesystem>
#include <fstream>
#include <sstream>

#include "namespace_host.h"

namespace {

using Hadro::Test::Has;
using Hadro::Test::Slurp;

using nlohmann::json;

class NetstacksTest : public Hadro::Test::NamespaceHostTest {
protected:
    // A sysctl of a named namespace (or of the test's own, for an empty name), as sysctl -n shows it.
    std::string Sysctl(const std::string& netns, const std::string& name) {
        std::string prefix = netns.empty() ? "" : "ip netns exec " + netns + " ";
        std::string value = Sh(prefix + "sysctl -n " + name);
        while (!value.empty() && value.back() == '\n')
            value.pop_back();
        return value;
    }
    std::string Namespaces() { return Sh("ip netns list | cut -d' ' -f1 | sort | tr '\\n' ' '"); }
    json Get(const std::string& key) {
        auto list = HadroJson("network ip netstack get -N " + key);
        return list.is_array() && list.size() == 1 ? list[0] : json();
    }
    void ExpectRefused(const std::string& arguments, const std::string& message) {
        auto result = Hadro(arguments);
        EXPECT_EQ(result.status, 1) << arguments << "\n" << result.All();
        EXPECT_EQ(result.err, message + "\n") << arguments;
    }
};

TEST_F(NetstacksTest, ListsTheDefaultAndTheNamedNamespaces) {
    Sh("ip netns add blue && ip netns add amber");
    auto list = HadroJson("network ip netstack list");
    EXPECT_EQ(list, json::parse(R"([{"Key":"defaultTcpipStack","Name":"defaultTcpipStack","State":4660},
                                    {"Key":"amber","Name":"amber","State":4660},
                                    {"Key":"blue","Name":"blue","State":4660}])"));
    Sh("sysctl -qw net.core.somaxconn=777 net.ipv4.tcp_congestion_control=reno");
    EXPECT_EQ(Get("defaultTcpipStack"), json::parse(R"({"Key":"defaultTcpipStack","Name":"defaultTcpipStack",
        "Enabled":true,"Max Connections":777,"Current Max Connections":777,"Congestion Control Algorithm":"newreno",
        "IPv6 Enabled":true,"Current IPv6 Enabled":true,"State":4660})"));
    EXPECT_EQ(Hadro("network ip netstack get -N nowhere").err,
              "Unable to find a Netstack instance nowhere\n");
}

TEST_F(NetstacksTest, AddMakesANamespaceWithTheNetstacksSettings) {
    EXPECT_EQ(Hadro("network ip netstack add -N glidex").status, 0);
    EXPECT_EQ(Namespaces(), "glidex ");
    EXPECT_EQ(Sysctl("glidex", "net.core.somaxconn"), "11000");
    EXPECT_EQ(Sysctl("glidex", "net.ipv4.tcp_congestion_control"), "reno");
    EXPECT_EQ(Sysctl("glidex", "net.ipv6.conf.all.disable_ipv6"), "0");
    EXPECT_TRUE(std::filesystem::is_directory("/etc/netns/glidex"));
    // Unlike `ip netns add`, its loopback is up: a netstack reaches itself from the start.
    EXPECT_EQ(ShJson("ip -n glidex -j link show lo")[0]["operstate"], "UNKNOWN");
    EXPECT_NE(Sh("ip -n glidex link show lo").find(",UP,"), std::string::npos);
    // As `ip netns add` leaves it: /run/netns a shared mount point, the namespace bound in it.
    EXPECT_NE(Sh("findmnt -no PROPAGATION /run/netns").find("shared"), std::string::npos);
    EXPECT_EQ(Sh("findmnt -no FSTYPE /run/netns/glidex"), "nsfs\n");
    EXPECT_EQ(Get("glidex"), json::parse(R"({"Key":"glidex","Name":"glidex","Enabled":true,
        "Max Connections":11000,"Current Max Connections":11000,"Congestion Control Algorithm":"newreno",
        "IPv6 Enabled":true,"Current IPv6 Enabled":true,"State":4660})"));

    ExpectRefused("network ip netstack add -N glidex",
                  "Unable to add Netstack Instance. Error was : Netstack instance 'glidex' already exists");
    auto invalid = Hadro("network ip netstack add -N ../etc");
    EXPECT_EQ(invalid.status, 1);
    EXPECT_NE(invalid.err.find("Invalid netstack instance key '../etc'"), std::string::npos) << invalid.err;
    EXPECT_EQ(Namespaces(), "glidex ");
}

TEST_F(NetstacksTest, SetChangesTheNamespacesSysctlsAtOnce) {
    Sh("ip netns add glidex");
    EXPECT_EQ(Hadro("network ip netstack set -N glidex -n 'Glidex stack' -m 2048 -c newreno -i false").status,
              0);
    EXPECT_EQ(Sysctl("glidex", "net.core.somaxconn"), "2048");
    EXPECT_EQ(Sysctl("glidex", "net.ipv4.tcp_congestion_control"), "reno");
    EXPECT_EQ(Sysctl("glidex", "net.ipv6.conf.all.disable_ipv6"), "1");
    EXPECT_EQ(Sysctl("glidex", "net.ipv6.conf.default.disable_ipv6"), "1");
    EXPECT_EQ(Get("glidex"), json::parse(R"({"Key":"glidex","Name":"Glidex stack","Enabled":true,
        "Max Connections":2048,"Current Max Connections":2048,"Congestion Control Algorithm":"newreno",
        "IPv6 Enabled":false,"Current IPv6 Enabled":false,"State":4660})"));
    EXPECT_EQ(json::parse(Slurp(document_))["netstacks"],
              json::parse(R"({"glidex":{"name":"Glidex stack"}})"));
    // The default netstack keeps its IPv6: each namespace has its own.
    EXPECT_EQ(Sysctl("", "net.ipv6.conf.all.disable_ipv6"), "0");

    // cubic where the kernel allows it to namespaces other than its first, else the refusal.
    std::string allowed = Slurp("/proc/sys/net/ipv4/tcp_allowed_congestion_control");
    auto cubic = Hadro("network ip netstack set -N glidex -c cubic");
    if (allowed.find("cubic") != std::string::npos) {
        EXPECT_EQ(cubic.status, 0) << cubic.All();
        EXPECT_EQ(Sysctl("glidex", "net.ipv4.tcp_congestion_control"), "cubic");
    } else {
        EXPECT_EQ(cubic.status, 1);
        EXPECT_NE(cubic.err.find("Error setting configuration for the netstack instance glidex. Error was : "
                                 "Congestion-control algorithm 'cubic' is not "),
                  std::string::npos)
            << cubic.err;
        EXPECT_NE(cubic.err.find("newreno"), std::string::npos) << cubic.err;
        EXPECT_EQ(Sysctl("glidex", "net.ipv4.tcp_congestion_control"), "reno");
    }
    // Out of range: the host's own bounds, nothing changed.
    ExpectRefused("network ip netstack set -N glidex -m 70000",
                  "Error setting configuration for the netstack instance glidex. Error was : Invalid maximum "
                  "number of connections 70000: it must be from 1 to 65535");
    EXPECT_EQ(Sysctl("glidex", "net.core.somaxconn"), "2048");
    EXPECT_EQ(Hadro("network ip netstack set -N glidex").status, 0);
    ExpectRefused("network ip netstack set -N nowhere -m 5", "Unable to find a Netstack instance nowhere");
}

TEST_F(NetstacksTest, ADisabledNetstackLivesInTheDocumentUntilEnabled) {
    EXPECT_EQ(Hadro("network ip netstack add -N ft --disabled").status, 0);
    EXPECT_EQ(Namespaces(), "");
    EXPECT_EQ(HadroJson("network ip netstack list")[1], json::parse(R"({"Key":"ft","Name":"ft","State":0})"));
    EXPECT_EQ(Hadro("network ip netstack set -N ft -m 3000 -i false -n 'FT stack'").status, 0);
    EXPECT_EQ(Get("ft"), json::parse(R"({"Key":"ft","Name":"FT stack","Enabled":false,"Max Connections":3000,
        "Current Max Connections":0,"Congestion Control Algorithm":"newreno","IPv6 Enabled":false,
        "Current IPv6 Enabled":false,"State":0})"));
    EXPECT_EQ(HadroJson("network ip connection list -N ft"), json::array());
    EXPECT_EQ(Namespaces(), "");

    EXPECT_EQ(Hadro("network ip netstack set -N ft -e true").status, 0);
    EXPECT_EQ(Namespaces(), "ft ");
    EXPECT_EQ(Sysctl("ft", "net.core.somaxconn"), "3000");
    EXPECT_EQ(Sysctl("ft", "net.ipv6.conf.default.disable_ipv6"), "1");
    EXPECT_EQ(Get("ft")["State"], 4660);
    EXPECT_EQ(Get("ft")["Name"], "FT stack");
    EXPECT_EQ(json::parse(Slurp(document_))["netstacks"], json::parse(R"({"ft":{"name":"FT stack"}})"));

    // Disabled again: the namespace goes, its settings stay for the next time.
    Sh("ip netns exec ft sysctl -qw net.core.somaxconn=4321");
    EXPECT_EQ(Hadro("network ip netstack set -N ft -e false").status, 0);
    EXPECT_EQ(Namespaces(), "");
    EXPECT_EQ(Get("ft")["Max Connections"], 4321);
    EXPECT_EQ(Get("ft")["State"], 0);
    EXPECT_EQ(Hadro("network ip netstack remove -N ft").status, 0);
    EXPECT_EQ(HadroJson("network ip netstack list").size(), 1u);
    EXPECT_EQ(json::parse(Slurp(document_))["netstacks"], json::object());
}

TEST_F(NetstacksTest, ANetstackWithInterfacesIsNeitherRemovedNorDisabled) {
    EXPECT_EQ(Hadro("network ip netstack add -N glidex").status, 0);
    Sh("ip link add v0 type veth peer name v1 netns glidex && ip -n glidex link add br9 type bridge");
    ExpectRefused(
        "network ip netstack remove -N glidex",
        "Unable to Remove Netstack Instance. Error was : Netstack instance 'glidex' cannot be removed "
        "while interfaces use it: v1, br9");
    ExpectRefused(
        "network ip netstack set -N glidex -e false",
        "Error setting configuration for the netstack instance glidex. Error was : Netstack instance "
        "'glidex' cannot be disabled while interfaces use it: v1, br9");
    EXPECT_EQ(Namespaces(), "glidex ");
    EXPECT_EQ(Sh("ip -n glidex -br link show v1").substr(0, 2), "v1");

    Sh("ip link del v0 && ip -n glidex link del br9");
    Sh("echo 'nameserver 192.0.2.9' > /etc/netns/glidex/resolv.conf");
    EXPECT_EQ(Hadro("network ip netstack remove -N glidex").status, 0);
    EXPECT_EQ(Namespaces(), "");
    EXPECT_FALSE(std::filesystem::exists("/etc/netns/glidex"));  // its resolver configuration went with it

    ExpectRefused("network ip netstack remove -N defaultTcpipStack",
                  "Unable to Remove Netstack Instance. Error was : The default netstack instance "
                  "'defaultTcpipStack' cannot be removed");
    ExpectRefused("network ip netstack set -N defaultTcpipStack -e false",
                  "Error setting configuration for the netstack instance defaultTcpipStack. Error was : The "
                  "default netstack instance 'defaultTcpipStack' cannot be disabled");
    ExpectRefused(
        "network ip netstack remove -N nowhere",
        "Unable to Remove Netstack Instance. Error was : Netstack instance 'nowhere' does not exist");
}

TEST_F(NetstacksTest, ANamespaceThatCannotTakeItsSettingsIsNotLeftBehind) {
    std::ofstream(document_)
        << R"({"version": 1, "netstacks": {"ft": {"disabled": true, "maxConnections": 500,
        "congestionControl": "nosuchalgo", "ipv6Enabled": true}}})";
    auto refused = Hadro("network ip netstack set -N ft -e true");
    EXPECT_EQ(refused.status, 1);
    EXPECT_NE(
        refused.err.find("Error setting configuration for the netstack instance ft. Error was : "
                         "Congestion-control algorithm 'nosuchalgo' is not available in the kernel, which "
                         "offers newreno"),
        std::string::npos)
        << refused.err;
    EXPECT_EQ(Namespaces(), "");
    EXPECT_EQ(Get("ft")["State"], 0);
    EXPECT_EQ(Get("ft")["Max Connections"], 500);
}

TEST_F(NetstacksTest, FilesOfEtcNetnsAndRunNetns) {
    // The administrator's files in /etc/netns/NAME stay when the netstack goes.
    Sh("ip netns add amber && mkdir -p /etc/netns/amber && echo '127.0.0.1 db' > /etc/netns/amber/hosts");
    EXPECT_EQ(Hadro("network ip netstack remove -N amber").All(),
              "Warning: /etc/netns/amber is kept: it holds files other than resolv.conf\n");
    EXPECT_EQ(Slurp("/etc/netns/amber/hosts"), "127.0.0.1 db\n");

    // No /etc/netns/NAME: the netstack is made all the same, and the user told.
    Sh("rm -r /etc/netns && touch /etc/netns");
    auto added = Hadro("network ip netstack add -N blue");
    EXPECT_EQ(added.status, 0);
    EXPECT_EQ(
        added.err,
        "Warning: cannot make /etc/netns/blue: the netstack has no files of its own for `ip netns exec`\n");
    EXPECT_EQ(Namespaces(), "blue ");
    EXPECT_EQ(Hadro("network ip netstack remove -N blue").All(), "");

    // No directory for namespaces at all: refused, nothing made.
    Sh("umount /run/netns && rmdir /run/netns && touch /run/netns");
    ExpectRefused(
        "network ip netstack add -N glidex",
        "Unable to add Netstack Instance. Error was : cannot make /run/netns/glidex: Not a directory");
    EXPECT_EQ(HadroJson("network ip netstack list").size(), 1u);
}

TEST_F(NetstacksTest, ReadsNeedNoPrivilegeAndChangesNeedRoot) {
    Sh("ip netns add blue");
    EXPECT_EQ(Hadro("network ip netstack add -N ft -d").status, 0);
    auto list = HadroUnprivileged("--formatter=json network ip netstack list");
    EXPECT_EQ(list.status, 0) << list.All();
    EXPECT_EQ(json::parse(list.out).size(), 3u);
    EXPECT_EQ(HadroUnprivileged("network ip netstack get -N defaultTcpipStack").status, 0);
    // A named namespace cannot be entered without privileges: a clear failure, not a crash.
    auto blue = HadroUnprivileged("network ip netstack get -N blue");
    EXPECT_EQ(blue.status, 1);
    EXPECT_NE(blue.err.find("cannot enter network namespace blue"), std::string::npos) << blue.err;

    const std::string needsRoot = "Changing the host's network needs root (CAP_NET_ADMIN)";
    for (const char* change :
         {"network ip netstack add -N red", "network ip netstack add -N red -d",
          "network ip netstack remove -N blue", "network ip netstack set -N blue -m 10",
          "network ip netstack set -N ft -e true", "network ip netstack set -N ft -n x"}) {
        auto refused = HadroUnprivileged(change);
        EXPECT_EQ(refused.status, 1) << change;
        EXPECT_NE(refused.err.find(needsRoot), std::string::npos) << change << "\n" << refused.err;
    }
    EXPECT_EQ(Namespaces(), "blue ");
    EXPECT_EQ(HadroJson("network ip netstack list").size(), 3u);
}

TEST_F(NetstacksTest, ADamagedDocumentIsRefusedAndKept) {
    const std::string damaged = R"({"version": 1, "netstacks": {"ft": {"disabled": "maybe"}}})";
    std::ofstream(document_) << damaged;
    auto result = Hadro("network ip netstack list");
    EXPECT_EQ(result.status, 3);
    EXPECT_NE(result.err.find(document_), std::string::npos) << result.err;
    EXPECT_NE(result.err.find("netstacks: 'ft': member 'disabled'"), std::string::npos) << result.err;
    EXPECT_EQ(Slurp(document_), damaged);
}

}  // namespace

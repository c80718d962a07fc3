// DNS servers and search domains of the Linux host: resolv.conf of each netstack.
#include <fstream>
#include <sstream>

#include "namespace_host.h"

namespace {

using Hadro::Test::Has;
using Hadro::Test::Slurp;

class DnsTest : public Hadro::Test::NamespaceHostTest {};

TEST_F(DnsTest, ListsAndChangesTheResolverConfigurationKeepingOtherLines) {
    EXPECT_EQ(Hadro("network ip dns server list").out, "DNS Servers: 192.0.2.53\n");
    EXPECT_EQ(Hadro("network ip dns server add -s 2001:db8::53").status, 0);
    EXPECT_EQ(Hadro("network ip dns search add -d lab.example").status, 0);
    EXPECT_EQ(Slurp("/etc/resolv.conf"),
              "# the test host's resolver\nnameserver 192.0.2.53\nnameserver 2001:db8::53\noptions ndots:2\n"
              "search lab.example\n");
    EXPECT_EQ(Hadro("network ip dns server remove -s 192.0.2.53").status, 0);
    EXPECT_EQ(Hadro("network ip dns server list").out, "DNS Servers: 2001:db8::53\n");
    EXPECT_EQ(Hadro("network ip dns search list").out, "DNS Search Domains: lab.example\n");
}

TEST_F(DnsTest, NamedNetstacksHaveTheirOwnFileAndUnknownOnesAreRefused) {
    Sh("ip netns add glidex");
    EXPECT_EQ(Hadro("network ip dns server add -s 10.9.9.9 -N glidex").status, 0);
    EXPECT_EQ(Slurp("/etc/netns/glidex/resolv.conf"), "nameserver 10.9.9.9\n");
    EXPECT_EQ(Sh("ip netns exec glidex cat /etc/resolv.conf"), "nameserver 10.9.9.9\n");
    auto unknown = Hadro("network ip dns server list -N nowhere");
    EXPECT_EQ(unknown.status, 1);
    EXPECT_NE(unknown.err.find("Netstack instance 'nowhere' does not exist"), std::string::npos)
        << unknown.err;
}

TEST_F(DnsTest, AFileManagedByAResolverDaemonIsShownButNotChanged) {
    Sh("mkdir -p /run/systemd/resolve && printf 'nameserver 127.0.0.53\\n' > "
       "/run/systemd/resolve/stub-resolv.conf"
       " && ln -sf /run/systemd/resolve/stub-resolv.conf /etc/resolv.conf");
    EXPECT_EQ(Hadro("network ip dns server list").out, "DNS Servers: 127.0.0.53\n");
    auto refused = Hadro("network ip dns server add -s 10.1.1.1");
    EXPECT_EQ(refused.status, 1);
    EXPECT_NE(refused.err.find("managed by systemd-resolved"), std::string::npos) << refused.err;
    EXPECT_EQ(Slurp("/run/systemd/resolve/stub-resolv.conf"), "nameserver 127.0.0.53\n");
}

TEST_F(DnsTest, AChangeNeedsRootAndAReadDoesNot) {
    EXPECT_EQ(HadroUnprivileged("network ip dns server list").out, "DNS Servers: 192.0.2.53\n");
    auto refused = HadroUnprivileged("network ip dns server add -s 10.1.1.1");
    EXPECT_EQ(refused.status, 1);
    EXPECT_NE(refused.err.find("Changing the host's network needs root (CAP_NET_ADMIN)"), std::string::npos)
        << refused.err;
    EXPECT_EQ(Slurp("/etc/resolv.conf").find("10.1.1.1"), std::string::npos);
}

TEST_F(DnsTest, ABindMountedFileIsRewrittenInPlace) {
    Sh("printf 'nameserver 192.0.2.1\\n' > " + dir_ + "/bound.conf && mount --bind " + dir_ +
       "/bound.conf /etc/resolv.conf");
    EXPECT_EQ(Hadro("network ip dns server add -s 192.0.2.2").status, 0);
    EXPECT_EQ(Slurp(dir_ + "/bound.conf"), "nameserver 192.0.2.1\nnameserver 192.0.2.2\n");
}

}  // namespace

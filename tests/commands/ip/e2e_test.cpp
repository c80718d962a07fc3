// The IP service commands through the real hadrocli and hadrosim on a state file.
#include <gtest/gtest.h>

#include <cstdio>
#include <filesystem>
#include <string>

#include "processes.h"

namespace {

class IpEndToEnd : public Hadro::Test::EndToEndTest {};

TEST_F(IpEndToEnd, ChangesLastAcrossRuns) {
    ASSERT_EQ(Cli("network ip dns search add --domain corp.example.org").status, 0);
    ASSERT_EQ(Cli("network ip route ipv4 add -n 10.0.0.0/8 -g 192.0.2.254").status, 0);
    ASSERT_EQ(Cli("network ip set -e false").status, 0);
    EXPECT_EQ(Cli("network ip dns search list").out,
              "DNS Search Domains: lab.example.com, example.com, corp.example.org\n");
    auto r = Cli("--formatter=json network ip route ipv4 list");
    EXPECT_NE(
        r.out.find(
            R"({"Network":"10.0.0.0","Netmask":"255.0.0.0","Gateway":"192.0.2.254","Interface":"tkn0","Source":"MANUAL"})"),
        std::string::npos)
        << r.out;
    EXPECT_EQ(Cli("network ip get").out, "IPv6 Enabled: false\n");
    EXPECT_EQ(Cli("--formatter=json network ip neighbor list -v 6").out, "[]\n");
}

TEST_F(IpEndToEnd, FailuresAreReportedOnStderr) {
    auto r = Cli("network ip route ipv4 remove -n default -g 192.0.2.77");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "192.0.2.77 is not a default route.\n");
    ASSERT_EQ(Sim("fault add TknCtl::Network::NetworkInfoImpl::GetCurrentUdpTarkonConnections --message "
                  "'stack busy'")
                  .status,
              0);
    r = Cli("network ip connection list");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "Unable to get connection list.\nstack busy\n");
    EXPECT_EQ(r.out, "");
}

}  // namespace

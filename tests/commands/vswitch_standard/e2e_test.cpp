// Standard switches through the real hadrocli and hadrosim on a state file.
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

#include "processes.h"

namespace {

class VswitchEndToEnd : public Hadro::Test::EndToEndTest {};

TEST_F(VswitchEndToEnd, ASwitchIsBuiltAcrossRuns) {
    std::string out;
    ASSERT_EQ(Cli("network vswitch standard add --vswitch-name=lab --ports=32", out), 0) << out;
    ASSERT_EQ(Cli("network vswitch standard uplink add -v lab -u vmnic6", out), 0) << out;
    ASSERT_EQ(Cli("network vswitch standard uplink add -v lab -u vmnic4", out), 0) << out;
    ASSERT_EQ(Cli("network vswitch standard portgroup add -v lab -p Bench", out), 0) << out;
    ASSERT_EQ(Cli("network vswitch standard portgroup set -p Bench -v 42", out), 0) << out;
    ASSERT_EQ(Cli("network vswitch standard policy failover set -v lab -a vmnic4 -s vmnic6", out), 0) << out;

    EXPECT_EQ(Cli("--formatter=table network vswitch standard list -v lab", out), 0);
    EXPECT_NE(out.find("lab   etherswitch  32         2           32"), std::string::npos) << out;
    EXPECT_EQ(Cli("network vswitch standard portgroup policy failover get -p Bench", out), 0);
    EXPECT_NE(out.find("Active Adapters: vmnic4\nStandby Adapters: vmnic6\n"), std::string::npos) << out;

    // The state stays valid as a whole.
    auto exported = Sim("export");
    EXPECT_EQ(exported.status, 0) << exported.err;
    EXPECT_NE(exported.out.find("\"name\":\"Bench\""), std::string::npos);
}

TEST_F(VswitchEndToEnd, RefusalsExitWithTheirMessages) {
    std::string out;
    EXPECT_EQ(Cli("network vswitch standard remove -v vSwitch0", out), 1);
    EXPECT_EQ(
        out,
        "Unable to remove virtual switch vSwitch0: Tarkon interface tkn0 is connected to its port group "
        "Management Network\n");
    EXPECT_EQ(Cli("network vswitch standard add -v lab -P 5000", out), 2);
    EXPECT_EQ(Sim("fault add HostCtl::Network::PortGroup::SetVlanId --message 'VLAN filter full'", out), 0);
    EXPECT_EQ(Cli("network vswitch standard portgroup set -p Migration -v 30", out), 1);
    EXPECT_EQ(out, "VLAN filter full\n");
}

}  // namespace

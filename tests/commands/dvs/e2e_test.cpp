// The distributed-switch commands through the real hadrocli and hadrosim on a state file.
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

#include "processes.h"

namespace {

class DvsEndToEnd : public Hadro::Test::EndToEndTest {};

TEST_F(DvsEndToEnd, TimeoutLastsAcrossRunsAndFaultsReachTheCommands) {
    std::string out;
    EXPECT_EQ(Cli("network vswitch dvs talvex lacp timeout set -t true -n vmnic3 -l 1 -s dvs-prod", out), 0)
        << out;
    EXPECT_EQ(Cli("--formatter=table network vswitch dvs talvex lacp status get", out), 0) << out;
    EXPECT_NE(
        out.find("Flags: FA, Admin Key: 3, Oper Key: 3, Port Priority: 255, Port Number: 1, Port State: "
                 "ACT,FTO,AGG,SYN,COL,DIST,"),
        std::string::npos)
        << out;
    EXPECT_EQ(Cli("network vswitch dvs talvex lacp timeout set -t true -n vmnic9 -l 1 -s dvs-prod", out), 1);
    EXPECT_EQ(out, "NIC vmnic9 is not a member of LAG 1 on distributed switch dvs-prod\n");

    EXPECT_EQ(Sim("fault add HostCtl::Network::Port::GetPacketStats --message 'stats locked'", out), 0);
    EXPECT_EQ(Cli("network port stats get -p 33554437", out), 1);
    EXPECT_EQ(out, "Unable to get stats for port: stats locked\n");
}

TEST_F(DvsEndToEnd, HelpShowsTheParameters) {
    std::string out;
    EXPECT_EQ(Cli("--formatter=json network vswitch dvs talvex lacp timeout set --help", out), 0) << out;
    EXPECT_NE(
        out.find(R"("parameters":[{"name":"timeout","short":"t","type":"boolean","required":true,)"
                 R"("description":"Set long or short timeout: 1 for short timeout and 0 for long timeout."},)"
                 R"({"name":"nic-name","short":"n","type":"string","required":false,)"
                 R"("description":"The nic name. If it is set, then only this vmnic in the lag will be )"
                 R"(configured."},{"name":"lag-id","short":"l","type":"integer","required":true,)"
                 R"("description":"The ID of LAG to be configured."},{"name":"qbr","short":"s",)"
                 R"("type":"string","required":true,"description":"The name of QBR."}])"),
        std::string::npos)
        << out;
    EXPECT_NE(out.find(R"("metadata":{},"formatter":"")"), std::string::npos) << out;
}

}  // namespace

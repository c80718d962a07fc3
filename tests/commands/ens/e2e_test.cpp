// ENS commands through the real hadrocli on a state file.
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

#include "processes.h"

namespace {

class EnsEndToEnd : public Hadro::Test::EndToEndTest {};

TEST_F(EnsEndToEnd, ContextsLastAcrossRuns) {
    std::string out;
    EXPECT_EQ(Cli("network ens lcore add -l 3", out), 0);
    EXPECT_EQ(Cli("network ens lcore switch add -l 3 -s vSwitch1", out), 0);
    EXPECT_EQ(Cli("network ens lcore affinity set -l 3 -a 1", out), 0);
    EXPECT_EQ(Cli("--formatter=json network ens lcore list", out), 0);
    EXPECT_EQ(out, "[{\"Lcore ID\":3,\"Switch\":\"vSwitch1\",\"Affinity\":1}]\n");
    EXPECT_EQ(Cli("network ens lcore add -l 3", out), 1);
    EXPECT_EQ(out, "false\n");
    EXPECT_EQ(Cli("network ens maxLcores set -n 3", out), 1);
    EXPECT_EQ(out, "The maximum number of ENS contexts cannot be 3: ENS context 3 exists; remove it first\n");
}

}  // namespace

// Netstack and IPsec commands through the real hadrocli on a state file.
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

#include "processes.h"

namespace {

class StacksEndToEnd : public Hadro::Test::EndToEndTest {};

TEST_F(StacksEndToEnd, NetstackChangesLastAcrossRuns) {
    EXPECT_EQ(Cli("network ip netstack add --netstack backup --disabled").status, 0);
    // Enabling comes before the limit within one call: this limit waits for the next creation.
    EXPECT_EQ(Cli("network ip netstack set -N backup --enable true --maxconn 30000").status, 0);
    auto get = Cli("network ip netstack get -N backup");
    EXPECT_EQ(get.status, 0);
    const std::string limits = "   Enabled: true\n   Max Connections: 30000\n   Current Max Connections: ";
    EXPECT_NE(get.All().find(limits + "11000\n"), std::string::npos) << get.All();
    EXPECT_EQ(Cli("network ip netstack set -N backup --enable false").status, 0);
    EXPECT_EQ(Cli("network ip netstack set -N backup --enable true").status, 0);
    EXPECT_NE(Cli("network ip netstack get -N backup").All().find(limits + "30000\n"), std::string::npos);
    auto refused = Cli("network ip netstack remove -N defaultTcpipStack");
    EXPECT_EQ(refused.status, 1);
    EXPECT_EQ(
        refused.All(),
        "Unable to Remove Netstack Instance. Error was : The default netstack instance 'defaultTcpipStack' "
        "cannot be removed\n");
    EXPECT_EQ(Cli("network ip netstack remove -N backup").status, 0);
    EXPECT_EQ(Cli("network ip netstack get -N backup").All(), "Unable to find a Netstack instance backup\n");
}

TEST_F(StacksEndToEnd, IpsecAssociationAndPolicy) {
    EXPECT_EQ(
        Cli("network ip ipsec sa add -n sa1 -s any -d 2001:db8::2 -p 0x1234 -e null -i hmac-sha1 -K key")
            .status,
        0);
    EXPECT_EQ(Cli("network ip ipsec sp add -n sp1 -a sa1 -s any -d 2001:db8::/64 -p 0 -P 0").status, 0);
    EXPECT_EQ(
        Cli("--formatter=json network ip ipsec sa list").All(),
        "[{\"Name\":\"sa1\",\"Source Address\":\"::\",\"Destination Address\":\"2001:db8::2\",\"State\":"
        "\"mature\",\"SPI\":\"0x1234\",\"Mode\":\"transport\",\"Encryption Algorithm\":\"null\",\"Integrity "
        "Algorithm\":\"hmac-sha1\",\"Lifetime\":\"infinite\"}]\n");
    EXPECT_EQ(Cli("network ip ipsec sa remove -n sa1").status, 0);
    auto list = Cli("network ip ipsec sp list");
    EXPECT_EQ(list.status, 1);
    EXPECT_NE(list.All().find("UNKNOWN*"), std::string::npos) << list.All();
    EXPECT_NE(list.All().find("*Some SPs with unique but deleted SAs were found."), std::string::npos)
        << list.All();
    // Refused on the command line: nothing runs.
    EXPECT_EQ(Cli("network ip ipsec sa add -n x -s any -d any -p 1 -e rot13 -i hmac-sha1 -K k").status, 2);
}

}  // namespace

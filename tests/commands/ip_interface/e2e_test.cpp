// The interface commands through the real hadrocli and hadrosim on a state file.
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

#include "processes.h"

namespace {

class IpInterfaceEndToEnd : public Hadro::Test::EndToEndTest {};

TEST_F(IpInterfaceEndToEnd, AnInterfaceLivesFromCreationToRemoval) {
    auto r = Cli("network ip interface add --portgroup-name 'VM Network' --interface-name tkn9 --mtu 9000");
    ASSERT_EQ(r.status, 0) << r.err;
    r = Cli("network ip interface ipv4 set -i tkn9 -t static -I 192.0.2.99 -N 255.255.255.0");
    ASSERT_EQ(r.status, 0) << r.err;
    r = Cli("--formatter=table network ip interface ipv4 get -i tkn9");
    EXPECT_EQ(r.out,
              "Name  IPv4 Address  IPv4 Netmask   IPv4 Broadcast  Address Type  Gateway  DHCP DNS\n"
              "----  ------------  -------------  --------------  ------------  -------  --------\n"
              "tkn9  192.0.2.99    255.255.255.0  192.0.2.255     STATIC        0.0.0.0  false\n");
    r = Cli("network ip interface list -N defaultTcpipStack");
    EXPECT_NE(r.out.find("tkn9\n   Name: tkn9\n"), std::string::npos) << r.out;
    EXPECT_NE(r.out.find("   MTU: 9000\n"), std::string::npos);

    EXPECT_EQ(Cli("network ip interface remove -i tkn9").status, 0);
    r = Cli("network ip interface remove -i tkn9");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "false\n");
    EXPECT_EQ(r.err, "Unable to find Tarkon network interface with the name tkn9\n");
}

TEST_F(IpInterfaceEndToEnd, ACommandLineErrorOrAHostFaultIsReported) {
    auto r = Cli("network ip interface add -p 'VM Network' -i tkn300");
    EXPECT_EQ(r.status, 2);
    EXPECT_NE(r.err.find("--interface-name"), std::string::npos) << r.err;

    ASSERT_EQ(
        Sim("fault add TknCtl::Network::TarkonNicInfoImpl::AddTarkonNic --message 'no ports left'").status,
        0);
    r = Cli("network ip interface add -p 'VM Network'");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "Unable to add Tarkon network interface. Error was : no ports left\n");
    EXPECT_EQ(Cli("network ip interface tag get -i tkn3").err,
              "Unable to find an interface with name tkn3\n");
}

}  // namespace

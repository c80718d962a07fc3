// "network ip interface ipv4|ipv6 ...": the IP configuration of interfaces and the host's rules.
#include "ip_interface_test.h"

namespace IpInterfaceTests {
namespace {

const char* const kNoSuch = "Unable to find a Tarkon interface with the name ";

// ---------------------------------------------------------------- IPv4

TEST_F(IpInterfaceTest, Ipv4ListingsAgreeAndTheNameWinsOverTheNetstack) {
    for (const char* options : {"", " -N glidex", " -i tkn2", " -i tkn1 -N defaultTcpipStack"}) {
        EXPECT_EQ(Run(std::string("network ip interface ipv4 get") + options).out,
                  Run(std::string("network ip interface ipv4 address list") + options).out)
            << options;
    }
    EXPECT_EQ(Run("network ip interface ipv4 get -N glidex").out,
              "Name  IPv4 Address   IPv4 Netmask   IPv4 Broadcast  Address Type  Gateway       DHCP DNS\n"
              "----  -------------  -------------  --------------  ------------  ------------  --------\n"
              "tkn1  198.51.100.21  255.255.255.0  198.51.100.255  STATIC        198.51.100.1  false\n");
    auto one = Json("network ip interface ipv4 get -i tkn1 -N defaultTcpipStack");
    ASSERT_EQ(one.size(), 1u);
    EXPECT_EQ(one[0]["Name"], "tkn1");
    auto dhcp = Json("network ip interface ipv4 get -i tkn2")[0];
    EXPECT_EQ(dhcp["Address Type"], "DHCP");
    EXPECT_EQ(dhcp["DHCP DNS"], true);

    auto r = Run("network ip interface ipv4 get -i tkn9");
    EXPECT_EQ(r.Errors(), Strings{std::string(kNoSuch) + "tkn9"});
    EXPECT_EQ(r.out, "");
    AddFault("HostCtl::Network::TknNic::GetIpConfig", "tkn0", "no configuration");
    EXPECT_EQ(Run("network ip interface ipv4 get").Errors(),
              Strings{"Error getting IPv4 configuration. . Error was : no configuration"});
}

TEST_F(IpInterfaceTest, Ipv4StaticSettingMovesTheInterface) {
    ASSERT_EQ(Run("network ip interface ipv4 set -i tkn0 -t static -I 10.1.2.3 -N 255.255.252.0 -g 10.1.0.1")
                  .status,
              0);
    auto nic = Json("network ip interface ipv4 get -i tkn0")[0];
    EXPECT_EQ(nic["IPv4 Address"], "10.1.2.3");
    EXPECT_EQ(nic["IPv4 Broadcast"], "10.1.3.255");
    EXPECT_EQ(nic["Gateway"], "10.1.0.1");
    EXPECT_EQ(Find("ports", "client", "tkn0")["ipv4"], "10.1.2.3");
    // Its connected route follows the address.
    std::string routes = Section("routes")[0]["ipv4"].dump();
    EXPECT_NE(
        routes.find(R"({"gateway":"0.0.0.0","interface":"tkn0","network":"10.1.0.0/22","source":"MANUAL"})"),
        std::string::npos)
        << routes;
    EXPECT_EQ(routes.find("192.0.2.0/24"), std::string::npos);

    // Without --gateway the gateway is reset.
    ASSERT_EQ(Run("network ip interface ipv4 set -i tkn0 -t static -I 10.1.2.3 -N 255.255.252.0").status, 0);
    EXPECT_EQ(Json("network ip interface ipv4 get -i tkn0")[0]["Gateway"], "0.0.0.0");
}

TEST_F(IpInterfaceTest, Ipv4SetChecksItsOptionsBeforeWriting) {
    auto before = Section("tknnics");
    auto errors = [&](const std::string& options) {
        return Run("network ip interface ipv4 set -i tkn0 " + options).Errors();
    };
    EXPECT_EQ(errors("-t static -I 10.0.0.1"),
              (Strings{"The --type=static requires the --ipv4 and --netmask options.",
                       "Invalid --netmask option provided. This address is not a valid IPv4 address"}));
    EXPECT_EQ(errors("-t static -I 10.0.0.300 -N 255.0.0.0 -g x"),
              (Strings{"Invalid --ipv4 option provided. This address is not a valid IPv4 address",
                       "Invalid --gateway option provided. This address is not a valid IPv4 address"}));
    EXPECT_EQ(errors("-I 10.0.0.1"),
              Strings{"-I|--ipv4 or -g|--gateway can be specified only if type is specified"});
    EXPECT_EQ(errors("-t dhcp -g 10.0.0.1"),
              Strings{"-I|--ipv4 or -g|--gateway can be specified only if type is static"});
    EXPECT_EQ(errors("-P true"), Strings{"-P|--peer-dns can be specified only if DHCP is enabled"});
    EXPECT_EQ(Section("tknnics"), before);

    // peer-dns false without DHCP writes the configuration back as it is.
    StartJournal();
    EXPECT_EQ(Run("network ip interface ipv4 set -i tkn0 -P false").status, 0);
    EXPECT_EQ(Journal("HostCtl::Network::TknNic::SetIpConfig"),
              Strings{"HostCtl::Network::TknNic::SetIpConfig tkn0"});
    EXPECT_EQ(Section("tknnics"), before);
    EXPECT_EQ(errors("-t static -I 10.0.0.1 -N 255.0.0.0 -g 10.0.0.300").size(), 1u);
    EXPECT_EQ(Run("network ip interface ipv4 set -i tkn9 -t none").Errors(),
              Strings{std::string(kNoSuch) + "tkn9"});
}

TEST_F(IpInterfaceTest, Ipv4DhcpAndNoneClearTheStaticSettings) {
    // A netmask beside dhcp is ignored; DHCP keeps no static address.
    ASSERT_EQ(Run("network ip interface ipv4 set -i tkn0 -t dhcp -N 255.0.0.0 -P true").status, 0);
    auto nic = Json("network ip interface ipv4 get -i tkn0")[0];
    EXPECT_EQ(nic["Address Type"], "DHCP");
    EXPECT_EQ(nic["IPv4 Address"], "0.0.0.0");
    EXPECT_EQ(nic["DHCP DNS"], true);
    // A lease is kept while DHCP stays on.
    ASSERT_EQ(Run("network ip interface ipv4 set -i tkn2 -t dhcp -P false").status, 0);
    EXPECT_EQ(Json("network ip interface ipv4 get -i tkn2")[0]["IPv4 Address"], "203.0.113.45");

    ASSERT_EQ(Run("network ip interface ipv4 set -i tkn2 -t none").status, 0);
    nic = Json("network ip interface ipv4 get -i tkn2")[0];
    EXPECT_EQ(nic["Address Type"], "NONE");
    EXPECT_EQ(nic["Gateway"], "0.0.0.0");
    EXPECT_EQ(nic["DHCP DNS"], false);
}

TEST_F(IpInterfaceTest, Ipv4AddressesFollowTheHostsRules) {
    auto refused = [&](const std::string& options) {
        auto errors = Run("network ip interface ipv4 set -i tkn0 -t static " + options).Errors();
        return errors.size() == 1 ? errors[0] : std::string("?");
    };
    const std::string prefix = "Error changing IPv4 configuration for the interface tkn0. Error was : ";
    EXPECT_EQ(refused("-I 10.0.0.1 -N 255.0.255.0"),
              prefix + "Invalid IPv4 netmask 255.0.255.0: it must be a contiguous mask of 1 to 32 bits");
    EXPECT_EQ(
        refused("-I 224.0.0.9 -N 255.0.0.0"),
        prefix + "IPv4 address 224.0.0.9 cannot be assigned to an interface: it is a multicast address");
    EXPECT_EQ(refused("-I 10.0.0.255 -N 255.255.255.0"),
              prefix + "IPv4 address 10.0.0.255 is the broadcast address of 10.0.0.0/24");
    EXPECT_EQ(refused("-I 10.0.0.1 -N 255.255.255.0 -g 10.0.1.1"),
              prefix + "IPv4 gateway 10.0.1.1 is not on the subnet 10.0.0.0/24 of tkn0");
    EXPECT_EQ(refused("-I 203.0.113.45 -N 255.255.255.0"),
              prefix + "IPv4 address 203.0.113.45 is already in use by tkn2 on netstack 'defaultTcpipStack'");
    // Another netstack may use the same address.
    EXPECT_EQ(Run("network ip interface ipv4 set -i tkn0 -t static -I 198.51.100.21 -N 255.255.255.0").status,
              0);
}

// ---------------------------------------------------------------- IPv6

TEST_F(IpInterfaceTest, Ipv6SettingsAndTheirRules) {
    auto tkn0 = Json("network ip interface ipv6 get -n tkn0")[0];
    EXPECT_EQ(tkn0["IPv6 Enabled"], true);
    EXPECT_EQ(tkn0["Gateway"], "2001:db8:10::1");
    EXPECT_EQ(Json("network ip interface ipv6 get -N glidex")[0]["Name"], "tkn1");

    // A setting without a gateway clears it.
    ASSERT_EQ(Run("network ip interface ipv6 set -i tkn0 -e true").status, 0);
    EXPECT_EQ(Json("network ip interface ipv6 get -n tkn0")[0]["Gateway"], "::");
    ASSERT_EQ(Run("network ip interface ipv6 set -i tkn0 -g 2001:db8:10::fe").status, 0);
    EXPECT_EQ(Json("network ip interface ipv6 get -n tkn0")[0]["Gateway"], "2001:db8:10::fe");

    auto errors = [&](const std::string& options) {
        return Run("network ip interface ipv6 set -i tkn0 " + options).Errors();
    };
    EXPECT_EQ(errors("-d true -g 2001:db8:10::1"),
              Strings{"Cannot set an interface gateway when DHCP/Router Advertisement is enabled."});
    EXPECT_EQ(errors("-P true"), Strings{"-P|--peer-dns can be specified only if DHCPv6 or RA is enabled"});
    EXPECT_EQ(errors("-g 2001:db8::zz"),
              Strings{"Invalid --gateway option provided.This address is not a valid IPv6 address"});
    EXPECT_EQ(errors("-g ff02::1"),
              Strings{"Error changing IPv6 configuration for the interface tkn0. Error was : "
                      "IPv6 gateway ff02::1 is not a unicast address"});
    EXPECT_EQ(Json("network ip interface ipv6 get -n tkn0")[0]["Gateway"], "2001:db8:10::fe");
    EXPECT_EQ(Run("network ip interface ipv6 set -i tkn9").Errors(), Strings{std::string(kNoSuch) + "tkn9"});

    ASSERT_EQ(Run("network ip interface ipv6 set -i tkn0 -d true -P true").status, 0);
    tkn0 = Json("network ip interface ipv6 get -n tkn0")[0];
    EXPECT_EQ(tkn0["DHCPv6 Enabled"], true);
    EXPECT_EQ(tkn0["DHCP DNS"], true);
}

TEST_F(IpInterfaceTest, Ipv6DynamicAddressesComeAndGoWithTheirSources) {
    auto addresses = [&](const std::string& nic) {
        Strings out;
        for (const auto& a : Json("network ip interface ipv6 address list -i " + nic))
            out.push_back(a["Address"].get<std::string>() + "/" + std::to_string(a["Netmask"].get<int>()) +
                          " " + a["Type"].get<std::string>() + " " + a["Status"].get<std::string>());
        return out;
    };
    ASSERT_EQ(Run("network ip interface ipv6 set -i tkn0 -r true -d true").status, 0);
    EXPECT_EQ(addresses("tkn0"),
              (Strings{"fe80::48:44ff:fe00:10/64 AUTOCONF PREFERRED", "2001:db8:10::10/64 STATIC PREFERRED",
                       "2001:db8:10:0:48:44ff:fe00:10/64 AUTOCONF PREFERRED",
                       "2001:db8:10::1:10/64 DHCP PREFERRED"}));
    ASSERT_EQ(Run("network ip interface ipv6 set -i tkn0 -r false").status, 0);
    EXPECT_EQ(addresses("tkn0"),
              (Strings{"fe80::48:44ff:fe00:10/64 AUTOCONF PREFERRED", "2001:db8:10::10/64 STATIC PREFERRED",
                       "2001:db8:10::1:10/64 DHCP PREFERRED"}));
    ASSERT_EQ(Run("network ip interface ipv6 set -i tkn0 -e false").status, 0);
    EXPECT_EQ(addresses("tkn0"), Strings{"2001:db8:10::10/64 STATIC PREFERRED"});
    ASSERT_EQ(Run("network ip interface ipv6 set -i tkn1 -e true").status, 0);
    EXPECT_EQ(addresses("tkn1"), Strings{"fe80::48:44ff:fe00:11/64 AUTOCONF PREFERRED"});

    // An address another interface of the netstack has is found duplicated.
    ASSERT_EQ(Run("network ip interface ipv6 address add -i tkn2 -I 2001:db8:10::10/64").status, 0);
    EXPECT_EQ(addresses("tkn2").back(), "2001:db8:10::10/64 STATIC DUPLICATED");
}

TEST_F(IpInterfaceTest, Ipv6AddressListMapsOriginsAndStates) {
    EditHost([](nlohmann::json& doc) {
        auto& list = doc["tknnics"][0]["ipv6"]["addresses"];
        list.push_back({{"address", "2001:db8:10::20/64"}, {"origin", 3}, {"status", 2}});
        list.push_back({{"address", "2001:db8:10::21/64"}, {"origin", 9}, {"status", 3}});
        list.push_back({{"address", "2001:db8:10::22/64"}, {"origin", 0}, {"status", 4}});
    });
    EXPECT_EQ(Run("network ip interface ipv6 address list -i tkn0").out,
              "Interface  Address                Netmask  Type      Status\n"
              "---------  ---------------------  -------  --------  ----------\n"
              "tkn0       fe80::48:44ff:fe00:10  64       AUTOCONF  PREFERRED\n"
              "tkn0       2001:db8:10::10        64       STATIC    PREFERRED\n"
              "tkn0       2001:db8:10::20        64                 TENTATIVE\n"
              "tkn0       2001:db8:10::21        64       DHCP      DUPLICATED\n"
              "tkn0       2001:db8:10::22        64       STATIC    PREFERRED\n");
    EXPECT_EQ(Json("network ip interface ipv6 address list").size(), 8u);
    EXPECT_EQ(Run("network ip interface ipv6 address list -i tkn9").Errors(),
              Strings{std::string(kNoSuch) + "tkn9"});
    AddFault("HostCtl::Network::TknNic::GetIpConfig", "tkn1", "gone");
    EXPECT_EQ(Run("network ip interface ipv6 address list").Errors(),
              Strings{"Unable to list IPv6 Addresses. Error was: gone"});
}

TEST_F(IpInterfaceTest, Ipv6AddressesAreAddedAndRemoved) {
    const std::string format =
        "Invalid format for IPv6 address. Address must be in the format <ipv6-address>/<prefix-length>   "
        "Example: "
        "1:2:3:4::/64";
    StartJournal();
    EXPECT_EQ(Run("network ip interface ipv6 address add -i tkn9 -I 2001:db8::5").Errors(), Strings{format});
    EXPECT_EQ(Run("network ip interface ipv6 address remove -i tkn0 -I nonsense/64").Errors(),
              Strings{format});
    EXPECT_TRUE(Journal().empty());

    ASSERT_EQ(Run("network ip interface ipv6 address add -i tkn1 -I 2001:db8:20::5/64").status, 0);
    EXPECT_EQ(Json("network ip interface ipv6 address list -i tkn1")[0]["Type"], "STATIC");
    EXPECT_EQ(
        Run("network ip interface ipv6 address add -i tkn1 -I 2001:db8:20::5/48").Errors(),
        Strings{
            "Error adding IPv6 address for the interface tkn1. Error was : IPv6 address 2001:db8:20::5 is "
            "already configured as 2001:db8:20::5/64"});
    EXPECT_EQ(
        Run("network ip interface ipv6 address remove -i tkn1 -I 2001:db8:20::5/48").Errors(),
        Strings{
            "Error removing IPv6 address for the interface tkn1. Error was : IPv6 address 2001:db8:20::5/48 "
            "is not configured"});
    EXPECT_EQ(
        Run("network ip interface ipv6 address add -i tkn1 -I ::1/128").Errors(),
        Strings{"Error adding IPv6 address for the interface tkn1. Error was : IPv6 address ::1 is not a "
                "unicast address"});
    ASSERT_EQ(Run("network ip interface ipv6 address remove -i tkn1 -I 2001:db8:20::5/64").status, 0);
    EXPECT_EQ(Json("network ip interface ipv6 address list -i tkn1"), nlohmann::json::array());
    EXPECT_EQ(Run("network ip interface ipv6 address remove -i tkn9 -I 2001:db8::5/64").Errors(),
              Strings{std::string(kNoSuch) + "tkn9"});
}

}  // namespace
}  // namespace IpInterfaceTests

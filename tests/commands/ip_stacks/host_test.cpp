// The host-control side of netstacks and IPsec where no command reaches it.
#include "harness.h"
#include "hostctl/exception.h"
#include "hostctl/network/ipsec.h"
#include "hostctl/network/netstack.h"
#include "hostctl/network/network_info.h"

namespace {

using HostCtl::Lib::HostCtlException;
namespace Net = HostCtl::Network;
using TknCtl::Network::IpSecConfigImpl;

class StacksHostTest : public Hadro::Test::CommandTest {};

TEST_F(StacksHostTest, ConvertersGiveDefaultsForEmptyTextsAndRefuseUnknownOnes) {
    IpSecConfigImpl ipsec;
    EXPECT_EQ(ipsec.StringToIpSecMode(""), Net::IPSEC_MODE_TRANSPORT);
    EXPECT_EQ(ipsec.StringToIpSecEncyptAlgo(""), Net::IPSEC_ENCRYPT_NULL);
    EXPECT_EQ(ipsec.StringToIpSecAuthAlgo(""), Net::IPSEC_AUTH_HMAC_SHA1);
    EXPECT_EQ(ipsec.StringToIpSecULProtoType(""), Net::IPSEC_PROTO_ANY);
    EXPECT_EQ(ipsec.StringToIpSecDirection(""), Net::IPSEC_DIRECTION_OUT);
    EXPECT_EQ(ipsec.StringToIpSecAction(""), Net::IPSEC_ACTION_IPSEC);

    // Each table's names convert to their index.
    for (std::size_t i = 0; i < IpSecConfigImpl::SP_UL_PROTO_TYPE.size(); ++i)
        EXPECT_EQ(ipsec.StringToIpSecULProtoType(IpSecConfigImpl::SP_UL_PROTO_TYPE[i]), i);
    EXPECT_EQ(ipsec.StringToIpSecEncyptAlgo("aes128-cbc"), Net::IPSEC_ENCRYPT_AES128_CBC);
    EXPECT_EQ(IpSecConfigImpl::SA_STATE[Net::IPSEC_SA_STATE_MATURE], "mature");

    try {
        ipsec.StringToIpSecMode("Tunnel");
        FAIL() << "accepted";
    } catch (const HostCtlException& e) {
        EXPECT_STREQ(e.what(), "Unknown IPsec mode 'Tunnel': use one of transport, tunnel");
    }
    EXPECT_THROW(ipsec.StringToIpSecAction("pass"), HostCtlException);
    EXPECT_THROW(ipsec.StringToIpSecDirection("both"), HostCtlException);
}

TEST_F(StacksHostTest, RecordsWithValuesOutsideTheTablesAreRefused) {
    IpSecConfigImpl ipsec;
    Net::IpSecSadParam sa;
    sa.name = "sa";
    sa.spi = 0x500;
    sa.integrityKey = "k";
    sa.mode = static_cast<Net::IpSecMode>(7);
    EXPECT_THROW(ipsec.AddSADConfig(sa), HostCtlException);
    Net::IpSecSpdParam sp;
    sp.spName = "sp";
    sp.sourcePrefixLength = 129;
    EXPECT_THROW(ipsec.AddSPDConfig(sp), HostCtlException);
    std::vector<Net::IpSecSpdParam> sps{sp};
    ipsec.GetSPDConfigList(sps);
    EXPECT_TRUE(sps.empty());
}

TEST_F(StacksHostTest, ANewNetstackHoldsItsValuesUntilAdded) {
    TknCtl::Network::NetworkInfoImpl info;
    TknCtl::Network::NetstackInstanceImpl fresh("lab", 11000, "newreno", true, 2);
    fresh.SetMaxConnections(500, true);
    fresh.SetName("Lab stack", true);
    EXPECT_THROW(fresh.Enable(), HostCtlException);
    EXPECT_EQ(info.LookupNetstackInstanceByKey("lab"), nullptr);
    EXPECT_EQ(fresh.GetState(), 0u);

    info.AddNetstackInstance(&fresh, false);
    EXPECT_EQ(info.GetNetstackInstanceState("lab"), Net::NETSTACK_STATE_ENABLED);
    auto found = info.LookupNetstackInstanceByKey("lab");
    ASSERT_NE(found, nullptr);
    EXPECT_EQ(found->GetName(), "Lab stack");
    EXPECT_EQ(found->GetCurrentMaxConnections(), 500u);
    // The added object now stands for the netstack on the host.
    fresh.SetCongestionControlAlgorithm("cubic", true);
    EXPECT_EQ(found->GetCongestionControlAlgorithm(), "cubic");
    EXPECT_THROW(info.AddNetstackInstance(&fresh, false), HostCtlException);

    TknCtl::Network::NetstackInstanceImpl otherKind("odd", 11000, "newreno", true, 3);
    EXPECT_THROW(info.AddNetstackInstance(&otherKind, true), HostCtlException);
    EXPECT_THROW(info.AddNetstackInstance(nullptr, true), HostCtlException);

    // A removed netstack's objects refuse to work.
    info.RemoveNetstackInstance("lab", false);
    EXPECT_THROW(found->GetName(), HostCtlException);
    EXPECT_THROW(info.GetNetstackInstanceState("lab"), HostCtlException);
}

}  // namespace

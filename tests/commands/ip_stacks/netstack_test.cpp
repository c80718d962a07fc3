// "network ip netstack ...": listing, inspecting, creating, configuring and removing netstacks.
#include <nlohmann/json.hpp>

#include "harness.h"

namespace {

using Hadro::Test::CommandTest;
using Strings = std::vector<std::string>;

class NetstackTest : public CommandTest {
protected:
    // The netstack of that key in the host's state.
    nlohmann::json Netstack(const std::string& key) {
        for (const auto& n : Section("netstacks"))
            if (n["key"] == key) return n;
        return nullptr;
    }
};

TEST_F(NetstackTest, ListShowsEveryNetstackUnderItsKey) {
    auto r = Run("network ip netstack list");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out,
              "defaultTcpipStack\n"
              "   Key: defaultTcpipStack\n"
              "   Name: defaultTcpipStack\n"
              "   State: 4660\n"
              "\n"
              "glidex\n"
              "   Key: glidex\n"
              "   Name: glidex\n"
              "   State: 4660\n"
              "\n"
              "PellixProvisioning\n"
              "   Key: PellixProvisioning\n"
              "   Name: PellixProvisioning\n"
              "   State: 0\n");
}

TEST_F(NetstackTest, GetShowsEnabledOnlyForState4660) {
    auto r = Run("--formatter=json network ip netstack get --netstack glidex");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(
        nlohmann::json::parse(r.out),
        nlohmann::json::parse(R"([{"Key":"glidex","Name":"glidex","Enabled":true,"Max Connections":11000,
                "Current Max Connections":11000,"Congestion Control Algorithm":"cubic","IPv6 Enabled":true,
                "Current IPv6 Enabled":true,"State":4660}])"));

    EXPECT_EQ(Run("network ip netstack get -N PellixProvisioning").out,
              "PellixProvisioning\n"
              "   Key: PellixProvisioning\n"
              "   Name: PellixProvisioning\n"
              "   Enabled: false\n"
              "   Max Connections: 11000\n"
              "   Current Max Connections: 0\n"
              "   Congestion Control Algorithm: newreno\n"
              "   IPv6 Enabled: true\n"
              "   Current IPv6 Enabled: false\n"
              "   State: 0\n");

    // Any state other than 4660 is not enabled.
    EditHost([](nlohmann::json& doc) { doc["netstacks"][1]["state"] = 4661; });
    auto odd = nlohmann::json::parse(Run("--formatter=json network ip netstack get -N glidex").out);
    EXPECT_EQ(odd[0]["Enabled"], false);
    EXPECT_EQ(odd[0]["State"], 4661);
}

TEST_F(NetstackTest, GetOfAnUnknownKeyNamesIt) {
    auto r = Run("network ip netstack get --netstack nosuch");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), std::vector<std::string>{"Unable to find a Netstack instance nosuch"});
}

TEST_F(NetstackTest, AddCreatesInTheKernelOrInTheConfigurationOnly) {
    StartJournal();
    auto r = Run("network ip netstack add --netstack glidex2");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(
        Journal("TknCtl::Network::NetworkInfoImpl::AddNetstackInstance"),
        std::vector<std::string>{"TknCtl::Network::NetworkInfoImpl::AddNetstackInstance glidex2 false"});
    auto added = Netstack("glidex2");
    EXPECT_EQ(added["state"], 4660);
    EXPECT_EQ(added["name"], "glidex2");
    EXPECT_EQ(added["maxConnections"], 11000);
    EXPECT_EQ(added["currentMaxConnections"], 11000);
    EXPECT_EQ(added["congestionControl"], "newreno");
    EXPECT_EQ(added["currentIpv6Enabled"], true);

    EXPECT_EQ(Run("network ip netstack add -N spare -d").status, 0);
    auto spare = Netstack("spare");
    EXPECT_EQ(spare["state"], 0);
    EXPECT_EQ(spare["currentMaxConnections"], 0);
    EXPECT_EQ(spare["currentIpv6Enabled"], false);
    EXPECT_EQ(Section("netstacks").size(), 5u);
}

TEST_F(NetstackTest, AddRefusesTakenAndMalformedKeys) {
    auto taken = Run("network ip netstack add --netstack glidex");
    EXPECT_EQ(taken.status, 1);
    EXPECT_EQ(taken.Errors(),
              std::vector<std::string>{"Unable to add Netstack Instance. Error was : Netstack "
                                       "instance 'glidex' already exists"});
    for (const char* key : {"", "1stack", "has space", "a/b", "abcdefghijklmnopqrstuvwxyz0123456"}) {
        auto r = Run(std::vector<std::string>{"network", "ip", "netstack", "add", "--netstack", key});
        EXPECT_EQ(r.status, 1) << key;
        EXPECT_NE(r.err.find("Unable to add Netstack Instance. Error was : Invalid netstack instance key"),
                  std::string::npos)
            << r.err;
    }
    EXPECT_EQ(Section("netstacks").size(), 3u);
}

TEST_F(NetstackTest, SetAppliesItsStepsInOrderAndSkipsEmptyTexts) {
    StartJournal();
    auto r =
        Run("network ip netstack set -N PellixProvisioning --name Prov --enable true --maxconn 20000 "
            "--ccalgo cubic --ipv6enabled false");
    EXPECT_EQ(r.status, 0) << r.err;
    std::vector<std::string> setters;
    for (const auto& line : Journal("HostCtl::Network::NetstackInstance::"))
        setters.push_back(line);
    EXPECT_EQ(setters,
              (std::vector<std::string>{
                  "HostCtl::Network::NetstackInstance::SetName PellixProvisioning Prov true",
                  "HostCtl::Network::NetstackInstance::Enable PellixProvisioning",
                  "HostCtl::Network::NetstackInstance::SetMaxConnections PellixProvisioning 20000 true",
                  "HostCtl::Network::NetstackInstance::SetCongestionControlAlgorithm PellixProvisioning "
                  "cubic true",
                  "HostCtl::Network::NetstackInstance::SetIpv6Enabled PellixProvisioning false true",
              }));
    auto n = Netstack("PellixProvisioning");
    EXPECT_EQ(n["name"], "Prov");
    EXPECT_EQ(n["state"], 4660);
    EXPECT_EQ(n["congestionControl"], "cubic");
    // Enabled with what was configured then; the new limit and IPv6 switch wait for the next creation.
    EXPECT_EQ(n["maxConnections"], 20000);
    EXPECT_EQ(n["currentMaxConnections"], 11000);
    EXPECT_EQ(n["ipv6Enabled"], false);
    EXPECT_EQ(n["currentIpv6Enabled"], true);

    // An empty name changes nothing (an empty algorithm is no value of its enumeration and is
    // refused before the command runs); "enable" absent calls neither Enable nor Disable.
    StartJournal();
    EXPECT_EQ(
        Run(Strings{"network", "ip", "netstack", "set", "-N", "PellixProvisioning", "--name", ""}).status, 0);
    EXPECT_EQ(Journal("HostCtl::Network::NetstackInstance::"), Strings{});
    EXPECT_EQ(
        Run(Strings{"network", "ip", "netstack", "set", "-N", "PellixProvisioning", "--ccalgo", ""}).status,
        2);
    EXPECT_EQ(Netstack("PellixProvisioning")["name"], "Prov");

    // Re-created, it takes the configured values.
    EXPECT_EQ(Run("network ip netstack set -N PellixProvisioning -e false").status, 0);
    EXPECT_EQ(Netstack("PellixProvisioning")["state"], 0);
    EXPECT_EQ(Run("network ip netstack set -N PellixProvisioning -e true").status, 0);
    n = Netstack("PellixProvisioning");
    EXPECT_EQ(n["currentMaxConnections"], 20000);
    EXPECT_EQ(n["currentIpv6Enabled"], false);
}

TEST_F(NetstackTest, SetOffersTheHostsAlgorithmsOnly) {
    auto help = nlohmann::json::parse(Run("--formatter=json network ip netstack set --help").out);
    nlohmann::json ccalgo;
    for (const auto& p : help["parameters"])
        if (p["name"] == "ccalgo") ccalgo = p;
    EXPECT_EQ(ccalgo["constraint"]["values"],
              nlohmann::json::parse(R"([{"value":"newreno","help":"Set newreno as the algorithm"},
                                        {"value":"cubic","help":"Set cubic as the algorithm"}])"));
    EXPECT_EQ(ccalgo["short"], "c");

    auto r = Run("network ip netstack set -N glidex --ccalgo vegas");
    EXPECT_EQ(r.status, 2);
    EXPECT_NE(r.err.find("--ccalgo"), std::string::npos) << r.err;
    EXPECT_EQ(Netstack("glidex")["congestionControl"], "cubic");
}

TEST_F(NetstackTest, SetReportsFailuresAndKeepsEarlierSteps) {
    // glidex carries tkn1: it cannot be disabled, but the name set before stays.
    auto r = Run("network ip netstack set -N glidex --name Migration --enable false --maxconn 5");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.Errors(),
              std::vector<std::string>{"Error setting configuration for the netstack instance glidex. "
                                       "Error was : Netstack instance 'glidex' cannot be disabled "
                                       "while Tarkon interfaces use it: tkn1"});
    EXPECT_EQ(Netstack("glidex")["name"], "Migration");
    EXPECT_EQ(Netstack("glidex")["maxConnections"], 11000);

    EXPECT_EQ(Run("network ip netstack set -N nosuch --name x").Errors(),
              std::vector<std::string>{"Unable to find a Netstack instance nosuch"});
    EXPECT_EQ(
        Run("network ip netstack set -N PellixProvisioning --maxconn -1").Errors(),
        std::vector<std::string>{"Error setting configuration for the netstack instance PellixProvisioning. "
                                 "Error was : Invalid maximum number of connections -1: it must be from 1 "
                                 "to 65535"});
    EXPECT_EQ(Run("network ip netstack set -N PellixProvisioning --maxconn 4294967297").status, 1);
    EXPECT_EQ(Netstack("PellixProvisioning")["maxConnections"], 11000);

    // A call with only the key changes nothing and succeeds.
    auto before = Export();
    EXPECT_EQ(Run("network ip netstack set -N glidex").status, 0);
    EXPECT_EQ(Export(), before);
}

TEST_F(NetstackTest, RemoveKeepsTheDefaultAndNetstacksInUse) {
    auto r = Run("network ip netstack remove --netstack defaultTcpipStack");
    EXPECT_EQ(r.Errors(),
              std::vector<std::string>{"Unable to Remove Netstack Instance. Error was : The default "
                                       "netstack instance 'defaultTcpipStack' cannot be removed"});
    EXPECT_EQ(
        Run("network ip netstack remove -N glidex").Errors(),
        std::vector<std::string>{"Unable to Remove Netstack Instance. Error was : Netstack instance 'glidex' "
                                 "cannot be removed while Tarkon interfaces use it: tkn1"});
    EXPECT_EQ(
        Run("network ip netstack remove -N nosuch").Errors(),
        std::vector<std::string>{"Unable to Remove Netstack Instance. Error was : Netstack instance 'nosuch' "
                                 "does not exist"});
    EXPECT_EQ(Section("netstacks").size(), 3u);
}

TEST_F(NetstackTest, RemoveTakesTheNetstacksTablesAlong) {
    // A netstack without interfaces but with routes, DNS settings, neighbours and sockets.
    EditHost([](nlohmann::json& doc) {
        for (const char* section : {"routes", "dns", "neighbors", "connections"}) {
            nlohmann::json copy;
            for (const auto& entry : doc[section])
                if (entry["netstack"] == "glidex") copy = entry;
            copy["netstack"] = "PellixProvisioning";
            doc[section].push_back(copy);
        }
        doc["netstacks"][2]["state"] = 4660;
    });
    // Disabling drops the run-time tables (neighbours, sockets) and keeps the configuration.
    EXPECT_EQ(Run("network ip netstack set -N PellixProvisioning -e false").status, 0);
    auto stacks = [&](const char* section) {
        std::vector<std::string> keys;
        for (const auto& entry : Section(section))
            keys.push_back(entry["netstack"]);
        return keys;
    };
    EXPECT_EQ(stacks("neighbors"), (std::vector<std::string>{"defaultTcpipStack", "glidex"}));
    EXPECT_EQ(stacks("connections"), (std::vector<std::string>{"defaultTcpipStack", "glidex"}));
    EXPECT_EQ(stacks("routes").size(), 3u);

    EXPECT_EQ(Run("network ip netstack remove -N PellixProvisioning").status, 0);
    EXPECT_EQ(Netstack("PellixProvisioning"), nullptr);
    EXPECT_EQ(stacks("routes"), (std::vector<std::string>{"defaultTcpipStack", "glidex"}));
    EXPECT_EQ(stacks("dns"), (std::vector<std::string>{"defaultTcpipStack", "glidex"}));
    // The host that is left is sound.
    EXPECT_NO_THROW(HostCtl::Lib::HostSession::ValidateDocument(Export(), "after removal"));
}

TEST_F(NetstackTest, HostFailuresBecomeOneMessage) {
    AddFault("TknCtl::Network::NetworkInfoImpl::ListNetstackInstances", "", "stack table busy");
    EXPECT_EQ(Run("network ip netstack list").Errors(), std::vector<std::string>{"stack table busy"});

    AddFault("HostCtl::Network::NetstackInstance::GetMaxConnections", "glidex", "read failed");
    auto get = Run("network ip netstack get -N glidex");
    EXPECT_EQ(get.out, "");
    EXPECT_EQ(get.Errors(),
              std::vector<std::string>{"Error getting Netstack instance configuration. . Error was : "
                                       "read failed"});

    AddFault("TknCtl::Network::NetworkInfoImpl::AddNetstackInstance", "", "no memory");
    EXPECT_EQ(Run("network ip netstack add -N extra").Errors(),
              std::vector<std::string>{"Unable to add Netstack Instance. Error was : no memory"});

    AddFault("HostCtl::Network::NetstackInstance::SetIpv6Enabled", "", "kernel refused");
    EXPECT_EQ(
        Run("network ip netstack set -N glidex -i false").Errors(),
        std::vector<std::string>{"Error setting configuration for the netstack instance glidex. Error was : "
                                 "kernel refused"});

    AddFault("TknCtl::Network::NetworkInfoImpl::RemoveNetstackInstance", "PellixProvisioning", "in use");
    EXPECT_EQ(Run("network ip netstack remove -N PellixProvisioning").Errors(),
              std::vector<std::string>{"Unable to Remove Netstack Instance. Error was : in use"});
    EXPECT_NE(Netstack("PellixProvisioning"), nullptr);
}

}  // namespace

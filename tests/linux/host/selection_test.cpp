// Choosing the host: the global option, the variable, what goes with which host, and what a run
// on the simulated host loads.
#include <fstream>

#include "namespace_host.h"

namespace {

class SelectionTest : public Hadro::Test::NamespaceHostTest {
protected:
    std::string Cli() const {
        return std::string("'") + HADROCLI + "' --plugin-dir='" + HADRO_PLUGIN_DIR + "' ";
    }
};

TEST_F(SelectionTest, TheOptionOrTheVariableChoosesTheHost) {
    Sh("ip link add eth9 type veth peer name eth9p");
    const std::string state = dir_ + "/host.json";
    // The simulated host by default; the Linux host by the option or the variable.
    EXPECT_NE(Sh(Cli() + "--state=" + state + " network ip interface list").find("tkn0"), std::string::npos);
    EXPECT_NE(Sh("HADRO_BACKEND=linux " + Cli() + "network ip interface list").find("eth9"),
              std::string::npos);
    EXPECT_NE(Sh("HADRO_BACKEND=linux " + Cli() + "--backend=simulated --state=" + state +
                 " network ip interface list")
                  .find("tkn0"),
              std::string::npos);

    auto unknown = Try(Cli() + "--backend=cloud network ip interface list");
    EXPECT_EQ(unknown.status, 2);
    EXPECT_EQ(unknown.err.substr(0, unknown.err.find('\n')),
              "Error: --backend: unknown host 'cloud' (choose simulated or linux)");
    auto fromVariable = Try("HADRO_BACKEND=cloud " + Cli() + "network ip interface list");
    EXPECT_EQ(fromVariable.status, 2);
    EXPECT_NE(fromVariable.err.find("HADRO_BACKEND: unknown host 'cloud'"), std::string::npos);
    auto withState = Try(Cli() + "--backend=linux --state=" + state + " network ip interface list");
    EXPECT_EQ(withState.status, 2);
    EXPECT_NE(withState.err.find("--state names the simulated host's state file"), std::string::npos);
}

TEST_F(SelectionTest, ARunOnTheSimulatedHostLoadsNothingOfTheLinuxHost) {
    auto loaded = Try("LD_DEBUG=files " + Cli() + "--state=" + dir_ + "/host.json network ip interface list");
    EXPECT_EQ(loaded.status, 0);
    EXPECT_EQ(loaded.err.find("hostctl-linux"), std::string::npos);
    EXPECT_EQ(loaded.err.find("libnl"), std::string::npos);
    auto linux = Try("LD_DEBUG=files " + Cli() + "--backend=linux network ip interface list");
    EXPECT_NE(linux.err.find("hostctl-linux"), std::string::npos);
}

TEST_F(SelectionTest, AMalformedConfigurationOrDamagedDocumentEndsTheRunAndIsKept) {
    Configure("nics = eth*\nspeed = fast\n");
    auto refused = Hadro("network nic list");
    EXPECT_EQ(refused.status, 3);
    EXPECT_EQ(refused.err, "Error: configuration " + dir_ +
                               "/linux.conf: line 2: unknown key 'speed' (known: nics, state)\n");

    Configure("");
    Sh("ip link add eth9 type veth peer name eth9p");
    std::ofstream(document_) << "{\"version\":1,";
    auto damaged = Hadro("network ip interface tag get -i eth9");
    EXPECT_EQ(damaged.status, 3) << damaged.All();
    EXPECT_NE(damaged.err.find("Linux host document " + document_ + ": not valid JSON"), std::string::npos)
        << damaged.err;
    EXPECT_EQ(Sh("cat " + document_), "{\"version\":1,");
}

}  // namespace

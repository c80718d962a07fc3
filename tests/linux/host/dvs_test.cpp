// What a plain Linux host answers for distributed switches, LACP, port statistics and virtual
// machines (it has none: the commands' own results for a host without them), and for ENS
// contexts (refused, one line each).
#include "namespace_host.h"

namespace {

using nlohmann::json;

class DvsTest : public Hadro::Test::NamespaceHostTest {
protected:
    void SetUp() override {
        NamespaceHostTest::SetUp();
        if (IsSkipped() || dir_.empty()) return;
        // A standard switch with an uplink and a bridge end: none of its ports is a VM's.
        Configure("nics = e1\n");
        Sh("ip link add e1 type veth peer name e1-peer && ip link add vp0 type veth peer name tkn0");
        Hadro("network vswitch standard add -v vs1");
        Hadro("network vswitch standard uplink add -v vs1 -u e1");
        Sh("ip link set vp0 master vs1");
    }
    void ExpectMessage(const std::string& arguments, const std::string& message) {
        auto result = Hadro(arguments);
        EXPECT_EQ(result.status, 1) << arguments << "\n" << result.All();
        EXPECT_EQ(result.err, message + "\n") << arguments;
    }
};

TEST_F(DvsTest, DistributedSwitchesAndLacpHaveNone) {
    EXPECT_EQ(HadroJson("network vswitch dvs talvex list"), json::array());
    ExpectMessage("network vswitch dvs talvex list -v vs1", "Unable to access all qBR");
    const std::string none =
        "LACP is supported on Talvex DVSwitch only, and there is no DVSwitch configured on host.";
    for (const char* kind : {"config", "status", "stats"})
        ExpectMessage(std::string("network vswitch dvs talvex lacp ") + kind + " get", none);
    ExpectMessage("network vswitch dvs talvex lacp config get -s vs1",
                  "Distributed switch 'vs1' does not exist");
    ExpectMessage("network vswitch dvs talvex lacp timeout set -t 1 -l 1 -s vs1",
                  "Distributed switch 'vs1' does not exist");
}

TEST_F(DvsTest, PortsAndVirtualMachinesHaveNone) {
    for (const char* port : {"0", "1", "2"}) {
        ExpectMessage(std::string("network port stats get -p ") + port, "Couldn't find requested port");
        ExpectMessage(std::string("network port filter stats get -p ") + port,
                      "Couldn't find requested port");
    }
    EXPECT_EQ(HadroJson("network vm list"), json::array());
    EXPECT_EQ(HadroJson("network vm port list -w 1"), json::array());
    EXPECT_EQ(HadroUnprivileged("--formatter=json network vm list").out, "[]\n");
}

TEST_F(DvsTest, EnsCommandsAreRefusedWithOneLine) {
    for (const char* command :
         {"maxLcores get", "maxLcores set -n 4", "lcore add -l 1", "lcore remove -l 1", "lcore list",
          "lcore switch get -l 1", "lcore switch add -l 1 -s vs1", "lcore switch remove -l 1",
          "lcore affinity get -l 1", "lcore affinity set -l 1 -a 0"}) {
        ExpectMessage(std::string("network ens ") + command,
                      "ENS contexts are not available on a Linux host");
    }
}

}  // namespace

// "network ens ...": the maximum number of ENS contexts, contexts, their switch and affinity.
#include <nlohmann/json.hpp>

#include "harness.h"

namespace {

using Hadro::Test::CommandTest;
using Strings = std::vector<std::string>;

class EnsTest : public CommandTest {
protected:
    // Contexts 0 (on vSwitch0, node 1) and 2 (no switch, node 0).
    void UseContexts() {
        EditHost([](nlohmann::json& doc) {
            doc["ens"]["lcores"] = nlohmann::json::parse(
                R"([{"id":0,"switch":"vSwitch0","affinity":1},{"id":2,"switch":"null","affinity":0}])");
        });
    }
};

TEST_F(EnsTest, MaximumCanBeReadAndSet) {
    auto r = Run("network ens maxLcores get");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, "4\n");
    EXPECT_EQ(Run("network ens maxLcores set --maxlcores 8").status, 0);
    EXPECT_EQ(Run("--formatter=json network ens maxLcores get").out, "8\n");

    UseContexts();
    EXPECT_EQ(Run("network ens maxLcores set -n 3").status, 0);
    EXPECT_EQ(
        Run("network ens maxLcores set -n 2").Errors(),
        Strings{"The maximum number of ENS contexts cannot be 2: ENS context 2 exists; remove it first"});
    EXPECT_EQ(Run("network ens maxLcores set -n 65").Errors(),
              Strings{"The maximum number of ENS contexts must be at most 64, not 65"});
    // A negative count reaches the host as a huge one, which it refuses.
    EXPECT_EQ(Run("network ens maxLcores set -n -1").status, 1);
    EXPECT_EQ(Section("ens")["maxLcores"], 3);
}

TEST_F(EnsTest, AddAndRemovePassTheHostsAnswerOn) {
    auto r = Run("network ens lcore add --lcore-id 1");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "");
    // Declined without error: false, exit 1, no message.
    r = Run("network ens lcore add -l 1");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.out, "false\n");
    EXPECT_EQ(r.err, "");
    EXPECT_EQ(Run("network ens lcore remove -l 3").out, "false\n");
    // Malformed: an error message and no result.
    r = Run("network ens lcore add -l 4");
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"ENS context ID 4 is out of range: IDs are below the maximum 4"});
    EXPECT_EQ(Run("network ens lcore remove -l -1").Errors(),
              Strings{"ENS context ID 18446744073709551615 is out of range: IDs are below the maximum 4"});

    EXPECT_EQ(Run("network ens lcore remove -l 1").status, 0);
    EXPECT_TRUE(Section("ens")["lcores"].empty());
}

TEST_F(EnsTest, ListAsksEachContextOnceInOrder) {
    auto empty = Run("--formatter=json network ens lcore list");
    EXPECT_EQ(empty.status, 0);
    EXPECT_EQ(empty.out, "[]\n");

    UseContexts();
    StartJournal();
    auto r = Run("network ens lcore list");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out,
              "Lcore ID  Switch    Affinity\n"
              "--------  --------  --------\n"
              "0         vSwitch0  1\n"
              "2         null      0\n");
    EXPECT_EQ(Journal("HostCtl::Network::NetworkInfo::"),
              (Strings{"HostCtl::Network::NetworkInfo::GetLcoreList",
                       "HostCtl::Network::NetworkInfo::GetLcoreSwitch 0",
                       "HostCtl::Network::NetworkInfo::GetLcoreAffinity 0",
                       "HostCtl::Network::NetworkInfo::GetLcoreSwitch 2",
                       "HostCtl::Network::NetworkInfo::GetLcoreAffinity 2"}));

    // A failure on the way leaves no partial list.
    AddFault("HostCtl::Network::NetworkInfo::GetLcoreAffinity", "", "NUMA table unreadable");
    r = Run("network ens lcore list");
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.Errors(), Strings{"NUMA table unreadable"});
}

TEST_F(EnsTest, SwitchAssociation) {
    UseContexts();
    EXPECT_EQ(Run("network ens lcore switch get -l 0").out, "vSwitch0\n");
    EXPECT_EQ(Run("network ens lcore switch get -l 2").out, "null\n");
    EXPECT_EQ(Run("network ens lcore switch get -l 1").Errors(), Strings{"ENS context 1 does not exist"});

    EXPECT_EQ(Run("network ens lcore switch add -l 2 --switch dvs-prod").status, 0);
    EXPECT_EQ(Run("network ens lcore switch get -l 2").out, "dvs-prod\n");
    EXPECT_EQ(Run("network ens lcore switch add -l 2 -s dvs-prod").out, "false\n");
    EXPECT_EQ(Run("network ens lcore switch add -l 2 -s vSwitch1").Errors(),
              Strings{"ENS context 2 already serves switch dvs-prod; disassociate it first"});
    EXPECT_EQ(Run("network ens lcore switch add -l 2 -s vSwitch9").Errors(),
              Strings{"Virtual switch 'vSwitch9' does not exist"});

    // Disassociation is an association with "null".
    StartJournal();
    EXPECT_EQ(Run("network ens lcore switch remove -l 2").status, 0);
    EXPECT_EQ(Journal("HostCtl::Network::NetworkInfo::"),
              Strings{"HostCtl::Network::NetworkInfo::AddLcoreSwitch null 2"});
    EXPECT_EQ(Run("network ens lcore switch get -l 2").out, "null\n");
    EXPECT_EQ(Run("network ens lcore switch remove -l 2").out, "false\n");
}

TEST_F(EnsTest, AffinityTakesTheNodeFirst) {
    UseContexts();
    EXPECT_EQ(Run("network ens lcore affinity get -l 0").out, "1\n");
    StartJournal();
    EXPECT_EQ(Run("network ens lcore affinity set --lcore-id 2 --affinity 1").status, 0);
    EXPECT_EQ(Journal("HostCtl::Network::NetworkInfo::"),
              Strings{"HostCtl::Network::NetworkInfo::SetLcoreAffinity 1 2"});
    EXPECT_EQ(Run("network ens lcore affinity get -l 2").out, "1\n");

    EXPECT_EQ(Run("network ens lcore affinity set -l 2 -a 2").Errors(),
              Strings{"NUMA node 2 does not exist: the host has 2 (0 to 1)"});
    EXPECT_EQ(Run("network ens lcore affinity set -l 3 -a 0").Errors(),
              Strings{"ENS context 3 does not exist"});
    // Node numbers beyond the host's parameter would wrap around to a real node.
    StartJournal();
    EXPECT_EQ(Run("network ens lcore affinity set -l 2 -a 4294967296").Errors(),
              Strings{"NUMA node 4294967296 does not exist"});
    EXPECT_EQ(Run("network ens lcore affinity set -l 2 -a -4294967295").Errors(),
              Strings{"NUMA node -4294967295 does not exist"});
    EXPECT_TRUE(Journal("HostCtl::Network::NetworkInfo::").empty());
    EXPECT_EQ(Section("ens")["lcores"][1]["affinity"], 1);
}

TEST_F(EnsTest, EachCommandReportsAHostFailure) {
    UseContexts();
    const char* const cases[][2] = {
        {"GetMaxLcores", "network ens maxLcores get"},
        {"SetMaxLcores", "network ens maxLcores set -n 5"},
        {"AddLcore", "network ens lcore add -l 1"},
        {"RemoveLcore", "network ens lcore remove -l 0"},
        {"GetLcoreList", "network ens lcore list"},
        {"GetLcoreSwitch", "network ens lcore switch get -l 0"},
        {"AddLcoreSwitch", "network ens lcore switch add -l 2 -s vSwitch1"},
        {"AddLcoreSwitch", "network ens lcore switch remove -l 0"},
        {"GetLcoreAffinity", "network ens lcore affinity get -l 0"},
        {"SetLcoreAffinity", "network ens lcore affinity set -l 0 -a 0"},
    };
    const auto before = Section("ens");
    for (const auto& c : cases) {
        AddFault(std::string("HostCtl::Network::NetworkInfo::") + c[0], "", std::string("ENS down: ") + c[0],
                 1);
        auto r = Run(c[1]);
        EXPECT_EQ(r.status, 1) << c[1];
        EXPECT_EQ(r.out, "") << c[1];
        EXPECT_EQ(r.Errors(), Strings{std::string("ENS down: ") + c[0]}) << c[1];
    }
    EXPECT_EQ(Section("ens"), before);
}

TEST_F(EnsTest, HelpShowsTheParametersAsDeclared) {
    auto help = nlohmann::json::parse(Run("--formatter=json network ens lcore affinity set --help").out);
    EXPECT_EQ(help["description"], "Set affinity for given ENS context.");
    EXPECT_EQ(help["parameters"], nlohmann::json::parse(R"([
        {"name":"lcore-id","short":"l","type":"integer","required":true,"description":"ENS context id."},
        {"name":"affinity","short":"a","type":"integer","required":true,"description":"Numa node affinity."}])"));
}

}  // namespace

// --dry-run on the simulated host, through the real programs: a command lists the host-control
// calls it would make (those the journal records when the real command runs) instead of its
// result, its checks and the host's refusals run as for real, and the state file stays byte for
// byte as it was.
#include <fstream>
#include <sstream>

#include "processes.h"

namespace {

std::string Bytes(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

class DryRun : public Hadro::Test::EndToEndTest {
protected:
    void SetUp() override {
        EndToEndTest::SetUp();
        ASSERT_EQ(Sim("reset").status, 0);
    }

    // What the real command records in the journal (the state is put back afterwards).
    std::string Journal(const std::string& command) {
        const std::string before = Bytes(state_);
        EXPECT_EQ(Sim("journal on").status, 0);
        Cli(command);
        std::string lines = Sim("journal show").out;
        std::ofstream(state_, std::ios::binary | std::ios::trunc) << before;
        return lines;
    }
};

TEST_F(DryRun, AChangeListsTheCallsTheJournalWouldRecordAndChangesNothing) {
    const std::string command = "network vswitch standard portgroup add -p Lab -v vSwitch1";
    const std::string expected = Journal(command);
    ASSERT_NE(expected, "");
    const std::string before = Bytes(state_);
    // The journal on or off makes no difference, and the journal is left alone.
    for (const char* journal : {"journal off", "journal on"}) {
        ASSERT_EQ(Sim(journal).status, 0);
        const std::string state = Bytes(state_);
        auto dry = Cli("--dry-run " + command);
        EXPECT_EQ(dry.status, 0) << dry.err;
        EXPECT_EQ(dry.out, expected);
        EXPECT_EQ(dry.err, "");
        EXPECT_EQ(Bytes(state_), state) << journal;
    }
    ASSERT_EQ(Sim("journal off").status, 0);
    EXPECT_EQ(Cli("network vswitch standard portgroup list").out.find("Lab"), std::string::npos);
    // The real run does it, as the dry run said.
    EXPECT_EQ(Cli(command).status, 0);
    EXPECT_NE(Cli("network vswitch standard portgroup list").out.find("Lab"), std::string::npos);
    EXPECT_NE(Bytes(state_), before);

    // A read lists its calls as well, instead of its result.
    auto read = Cli("--dry-run network ip dns server list");
    EXPECT_EQ(read.status, 0);
    EXPECT_EQ(read.out.rfind("TknCtl::", 0), 0u) << read.out;
    EXPECT_EQ(read.out.find("DNS Servers"), std::string::npos);

    // A state file that does not exist yet is not made.
    std::remove(state_.c_str());
    EXPECT_EQ(Cli("--dry-run " + command).status, 0);
    EXPECT_FALSE(std::ifstream(state_).good());
}

TEST_F(DryRun, RefusalsAndFaultsEndAsTheRealRunWouldLeavingTheStateAsItWas) {
    // The host's own refusal: its message, exit 1; the calls made until then are listed.
    const std::string taken = "network vswitch standard portgroup add -p 'VM Network' -v vSwitch1";
    auto dry = Cli("--dry-run " + taken);
    auto real = Cli(taken);
    EXPECT_EQ(dry.status, 1);
    EXPECT_EQ(dry.status, real.status);
    EXPECT_EQ(dry.err, real.err);
    EXPECT_NE(dry.out, "");
    // An injected fault is one of the host's refusals; its count is not used up.
    ASSERT_EQ(
        Sim("fault add TknCtl::Network::DnsConfigImpl::SaveConfig --message 'disk full' --count 1").status,
        0);
    const std::string faulted = Bytes(state_);
    auto fault = Cli("--dry-run network ip dns search add -d lab.example");
    EXPECT_EQ(fault.status, 1);
    EXPECT_EQ(fault.err, "disk full\n");
    EXPECT_EQ(Bytes(state_), faulted);
    EXPECT_EQ(Cli("network ip dns search add -d lab.example").err, "disk full\n");
    // A command line refused before anything runs, as always.
    auto refused = Cli("--dry-run network nic list --bogus");
    EXPECT_EQ(refused.status, 2);
    EXPECT_EQ(refused.out, "");
    // Given after the first word, the option is a global one out of place.
    auto late = Cli("network nic list --dry-run");
    EXPECT_EQ(late.status, 2);
    EXPECT_NE(late.err.find("unknown option --dry-run (global options go before the first word)"),
              std::string::npos)
        << late.err;
}

TEST_F(DryRun, NamesFromTheCommandLineAreShownSafely) {
    // (The host refuses the name, after the call that carries it.)
    auto dry =
        Cli("--dry-run network vswitch standard portgroup add -p \"$(printf 'a\\033[31mb')\" -v vSwitch1");
    EXPECT_EQ(dry.status, 1) << dry.err;
    EXPECT_EQ(dry.out.find('\x1b'), std::string::npos);
    EXPECT_NE(dry.out.find("a\\x1b[31mb"), std::string::npos) << dry.out;
}

TEST_F(DryRun, EveryLineOfABatchIsADryRunThatSeesTheLinesBeforeIt) {
    const std::string before = Bytes(state_);
    const std::string batch = dir_ + "/batch";
    std::ofstream(batch) << "network vswitch standard portgroup add -p Lab -v vSwitch1\n"
                            "network vswitch standard portgroup set -p Lab --vlan-id 30\n";
    auto lines = Cli("--dry-run --batch " + batch);
    EXPECT_EQ(lines.status, 0) << lines.err;
    EXPECT_NE(lines.out.find("HostCtl::Network::PortGroup::SetVlanId Lab 30\n"), std::string::npos)
        << lines.out;
    EXPECT_EQ(Bytes(state_), before);
    // Each line's calls, in order: the same as the two commands' own dry runs, the second
    // seeing the first.
    auto first = Cli("--dry-run network vswitch standard portgroup add -p Lab -v vSwitch1");
    EXPECT_EQ(lines.out.rfind(first.out, 0), 0u) << lines.out;
    auto alone = Cli("--dry-run network vswitch standard portgroup set -p Lab --vlan-id 30");
    EXPECT_EQ(alone.status, 1);  // without the first line, Lab does not exist

    // --atomic: the first line that fails stops the batch, with nothing on stdout.
    std::ofstream(batch) << "network vswitch standard portgroup add -p Lab -v vSwitch1\n"
                            "network vswitch standard portgroup add -p Lab -v vSwitch1\n";
    auto atomic = Cli("--dry-run --batch " + batch + " --atomic");
    EXPECT_EQ(atomic.status, 1);
    EXPECT_EQ(atomic.out, "");
    EXPECT_NE(atomic.err.find("line 2:"), std::string::npos) << atomic.err;
    EXPECT_EQ(Bytes(state_), before);

    // A line does not choose for itself.
    std::ofstream(batch) << "--dry-run network nic list\n";
    auto own = Cli("--batch " + batch);
    EXPECT_EQ(own.status, 2);
    EXPECT_NE(own.err.find("only --formatter and --format-param may stand before the words of a batch line"),
              std::string::npos)
        << own.err;
}

}  // namespace

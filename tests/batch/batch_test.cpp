// Batch mode of hadrocli (--batch, --atomic), through the real program on a state file.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

namespace {

struct Outcome {
    int status = -1;
    std::string out;
    std::string err;
};

std::string ReadAll(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

void WriteAll(const std::string& path, const std::string& text) {
    std::ofstream(path, std::ios::binary) << text;
}

class Batch : public ::testing::Test {
protected:
    void SetUp() override {
        char dir[] = "/tmp/hadro-batch-XXXXXX";
        ASSERT_NE(mkdtemp(dir), nullptr);
        dir_ = dir;
        state_ = dir_ + "/host.json";
        ASSERT_EQ(Cli("network nic list").status, 0);  // creates the state
    }
    void TearDown() override { std::filesystem::remove_all(dir_); }

    // Runs hadrocli with args (shell words) on the test's state, stdin from a file holding
    // input; env is put before the command.
    Outcome Cli(const std::string& args, const std::string& input = "", const std::string& env = "") {
        WriteAll(dir_ + "/in", input);
        std::string command = env + " " + HADROCLI + " --state=" + state_ +
                              " --plugin-dir=" + HADRO_PLUGIN_DIR + " " + args + " <" + dir_ + "/in >" +
                              dir_ + "/out 2>" + dir_ + "/err";
        int status = std::system(command.c_str());
        return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, ReadAll(dir_ + "/out"), ReadAll(dir_ + "/err")};
    }
    Outcome RunBatch(const std::string& lines, const std::string& options = "", const std::string& env = "") {
        return Cli(options + " --batch -", lines, env);
    }

    std::string dir_;
    std::string state_;
};

TEST_F(Batch, OutputMatchesSeparateRunsInOrder) {
    const std::vector<std::string> lines = {
        "network ip dns server list",
        "--formatter=json network ip interface list",
        "network nic get -n vmnic1",
        "network ip interface ipv4 get --interface-name tkn0",
    };
    std::string batch = "# what a script reads\n\n";
    std::string expected;
    for (const auto& line : lines) {
        batch += "   " + line + "   # annotated\n";
        auto single = Cli(line);
        ASSERT_EQ(single.status, 0) << line << single.err;
        expected += single.out;
    }
    auto r = RunBatch(batch);
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, expected);
    EXPECT_EQ(r.err, "");
    // The batch-wide formatter is each line's default; a line may choose its own.
    auto json = RunBatch("network ip dns server list\n--formatter=simple network ip dns server list\n",
                         "--formatter=json");
    EXPECT_EQ(json.out,
              Cli("--formatter=json network ip dns server list").out + Cli("network ip dns server list").out);
}

TEST_F(Batch, ShellQuoting) {
    auto r = RunBatch(
        "network vswitch standard portgroup add -p \"Lab Net\" -v vSwitch1\n"
        "network vswitch standard portgroup add -p Back\\ Slash\\\\ -v vSwitch1\n"
        "network vswitch standard portgroup add -p 'O'\"'\"'Hare#1' -v vSwitch1\n"
        "network vswitch standard portgroup add -p \"say \\\"hi\\\" \\n\" -v vSwitch1\n"
        "network vswitch standard portgroup add -p x#y -v vSwitch1 # x#y is a word, not a comment\n");
    ASSERT_EQ(r.status, 0) << r.err;
    auto list = Cli("--formatter=json network vswitch standard portgroup list");
    for (const char* name :
         {"\"Lab Net\"", "\"Back Slash\\\\\"", "\"O'Hare#1\"", "\"say \\\"hi\\\" \\\\n\"", "\"x#y\""})
        EXPECT_NE(list.out.find(std::string("\"Name\":") + name), std::string::npos) << name << list.out;

    auto bad = RunBatch("network nic list 'open\nnetwork nic list \"open\nnetwork nic list \\\n");
    EXPECT_EQ(bad.status, 2);
    EXPECT_EQ(bad.out, "");
    EXPECT_EQ(bad.err,
              "Error: a single quote is not closed\nline 1: network nic list 'open\n"
              "Error: a double quote is not closed\nline 2: network nic list \"open\n"
              "Error: the line ends with a backslash\nline 3: network nic list \\\n");
}

TEST_F(Batch, GoesOnAfterFailuresAndReportsTheFirst) {
    auto r = RunBatch(
        "network ip dns search add -d one.example\n"
        "network ip dns server remove -s 10.9.9.9\n"
        "network ip dns search add --bogus\n"
        "--state=/tmp/elsewhere network nic list\n"
        "network ip dns search add -d two.example\n");
    EXPECT_EQ(r.status, 1);
    EXPECT_NE(
        r.err.find(
            "DNS server 10.9.9.9 is not configured\nline 2: network ip dns server remove -s 10.9.9.9\n"),
        std::string::npos)
        << r.err;
    EXPECT_NE(r.err.find("line 3: network ip dns search add --bogus\n"), std::string::npos);
    EXPECT_NE(r.err.find("line 4: --state=/tmp/elsewhere network nic list\n"), std::string::npos);
    EXPECT_FALSE(std::filesystem::exists("/tmp/elsewhere"));
    auto domains = Cli("network ip dns search list").out;
    EXPECT_NE(domains.find("one.example"), std::string::npos);
    EXPECT_NE(domains.find("two.example"), std::string::npos);

    // The status is the first failure's, whatever follows.
    EXPECT_EQ(RunBatch("network nic list --bogus\nnetwork ip dns server remove -s 10.9.9.9\n").status, 2);
    EXPECT_EQ(RunBatch("\n# nothing\n").status, 0);
}

TEST_F(Batch, AtomicWritesOnceOrNothing) {
    const std::string changes =
        "network ip dns search add -d one.example\n"
        "network vswitch standard portgroup add -p Lab -v vSwitch1\n"
        "network ip dns server add -s 10.1.1.9\n";
    const std::string log = dir_ + "/opens";
    const std::string spy = std::string("LD_PRELOAD=") + OPEN_SPY + " OPEN_SPY_LOG=" + log;
    auto temporaryFiles = [&] {
        std::istringstream lines(ReadAll(log));
        int count = 0;
        for (std::string line; std::getline(lines, line);)
            count += line.find(".host.json.tmp.") != std::string::npos;
        std::filesystem::remove(log);
        return count;
    };

    // A failing line: nothing is written, nothing printed but its messages and where it is.
    const std::string before = ReadAll(state_);
    auto failed =
        RunBatch(changes + "network ip dns server list\nnetwork ip dns server remove -s 10.9.9.9\n" +
                     "network ip dns search add -d two.example\n",
                 "--atomic", spy);
    EXPECT_EQ(failed.status, 1);
    EXPECT_EQ(failed.out, "");
    EXPECT_EQ(failed.err,
              "DNS server 10.9.9.9 is not configured\nline 5: network ip dns server remove -s 10.9.9.9\n");
    EXPECT_EQ(ReadAll(state_), before);
    EXPECT_EQ(temporaryFiles(), 0);
    // A refused line rolls back as well, with its own status.
    auto refused = RunBatch(changes + "network ip dns search add\n", "--atomic");
    EXPECT_EQ(refused.status, 2);
    EXPECT_NE(refused.err.find("line 4: network ip dns search add\n"), std::string::npos) << refused.err;
    EXPECT_EQ(ReadAll(state_), before);

    // Success: every change, one write, the output of every line.
    auto done = RunBatch(changes + "network ip dns server list\n", "--atomic", spy);
    EXPECT_EQ(done.status, 0) << done.err;
    EXPECT_NE(done.out.find("10.1.1.9"), std::string::npos);
    EXPECT_EQ(temporaryFiles(), 1);
    EXPECT_NE(Cli("network ip dns search list").out.find("one.example"), std::string::npos);
    EXPECT_NE(Cli("network vswitch standard portgroup list").out.find("Lab"), std::string::npos);
    // Without --atomic each changing line is written on its own; reading lines write nothing.
    RunBatch(
        "network ip dns search add -d three.example\nnetwork nic list\nnetwork ip dns search remove -d "
        "three.example\n",
        "", spy);
    EXPECT_EQ(temporaryFiles(), 2);
    RunBatch("network nic list\nnetwork ip dns server list\n", "--atomic", spy);
    EXPECT_EQ(temporaryFiles(), 0);
}

TEST_F(Batch, RefusedInvocations) {
    WriteAll(dir_ + "/lines", "network nic list\n");
    auto atomicAlone = Cli("--atomic network nic list");
    EXPECT_EQ(atomicAlone.status, 2);
    EXPECT_NE(atomicAlone.err.find("option --atomic needs --batch"), std::string::npos);
    EXPECT_EQ(Cli("--batch " + dir_ + "/lines network nic list").status, 2);
    EXPECT_EQ(Cli("--batch " + dir_ + "/lines --list-commands").status, 2);
    EXPECT_EQ(Cli("--batch").status, 2);
    auto file = Cli("--batch " + dir_ + "/lines");
    EXPECT_EQ(file.status, 0);
    EXPECT_EQ(file.out, Cli("network nic list").out);
    auto missing = Cli("--batch " + dir_ + "/none");
    EXPECT_EQ(missing.status, 3);
    EXPECT_NE(missing.err.find("/none: cannot read: No such file or directory"), std::string::npos)
        << missing.err;
    // A damaged state file stops the batch at its first command, untouched.
    WriteAll(state_, "{\"version\":1,");
    auto damaged = Cli("--batch " + dir_ + "/lines");
    EXPECT_EQ(damaged.status, 3);
    EXPECT_NE(damaged.err.find("line 1: network nic list"), std::string::npos) << damaged.err;
    EXPECT_EQ(ReadAll(state_), "{\"version\":1,");
}

TEST_F(Batch, HadrosimGeneratesAScaleHost) {
    auto sim = [&](const std::string& args) {
        std::string command = std::string(HADROSIM) + " --state=" + state_ + " " + args + " >/dev/null 2>&1";
        int status = std::system(command.c_str());
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    };
    const std::string before = ReadAll(state_);
    for (const char* bad :
         {"generate", "generate --scale", "generate --scale 0", "generate --scale 17", "generate --scale 1x",
          "generate --scale nan", "generate --scale 1 --scale 2", "generate --size 1"}) {
        EXPECT_EQ(sim(bad), 2) << bad;
    }
    EXPECT_EQ(ReadAll(state_), before);
    ASSERT_EQ(sim("generate --scale 0.05"), 0);
    EXPECT_NE(Cli("network vm list").out.find("vm-00049"), std::string::npos);
    EXPECT_EQ(sim("export"), 0);
}

}  // namespace

// Terminal safety: names that come from the state file (a port group, a world) and text that
// comes from the command line can hold control characters. simple and table print them
// escaped, json as JSON escapes; error messages on stderr are escaped the same way, so that
// no crafted name can drive the terminal. In-process and through hadrocli.
#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>

#include "harness.h"
#include "zorbel/formatter.h"

namespace {

using nlohmann::json;

// Clears the screen, sets the window title, rings, returns the cursor, and a C1 CSI.
const std::string kPortGroup = "PG\x1b[2J\x1b]0;owned\x07\r\x08-\xc2\x9b" "31m";
const std::string kVm = "web\x1b[31m\n-01";

bool HasRawControl(const std::string& text) {
    for (std::size_t i = 0; i < text.size(); ++i) {
        unsigned char c = static_cast<unsigned char>(text[i]);
        if ((c < 0x20 && c != '\n') || c == 0x7f) return true;
        if (c == 0xc2 && i + 1 < text.size() && static_cast<unsigned char>(text[i + 1]) < 0xa0) return true;
    }
    return false;
}

void Craft(json& doc) {
    for (auto& vswitch : doc["vswitches"]) {
        if (vswitch["name"] == "vSwitch1") {
            auto group = vswitch["portGroups"][0];
            group["name"] = kPortGroup;
            group["activeClients"] = 0;
            vswitch["portGroups"].push_back(group);
        }
    }
    for (auto& world : doc["worlds"]) {
        if (world["name"] == "vmm0:web-01") world["name"] = "vmm0:" + kVm;
    }
}

class TerminalTest : public Hadro::Test::CommandTest {
protected:
    void SetUp() override {
        CommandTest::SetUp();
        EditHost(Craft);
    }
};

TEST_F(TerminalTest, NamesFromTheStateAreEscapedInSimpleAndTable) {
    for (const char* formatter : {"--formatter=simple", "--formatter=table"}) {
        auto groups = Run(std::vector<std::string>{formatter, "network", "vswitch", "standard", "portgroup", "list"});
        ASSERT_EQ(groups.status, 0) << groups.err;
        EXPECT_FALSE(HasRawControl(groups.out)) << formatter;
        EXPECT_NE(groups.out.find("PG\\x1b[2J\\x1b]0;owned\\x07\\r\\x08-\\u009b31m"), std::string::npos)
            << formatter << ": " << groups.out;

        auto vms = Run(std::vector<std::string>{formatter, "network", "vm", "list"});
        ASSERT_EQ(vms.status, 0) << vms.err;
        EXPECT_FALSE(HasRawControl(vms.out)) << formatter;
        EXPECT_NE(vms.out.find("web\\x1b[31m\\n-01"), std::string::npos) << formatter << ": " << vms.out;
        // A newline inside a value does not start a line of its own.
        EXPECT_EQ(vms.out.find("\n-01"), std::string::npos);
    }
}

TEST_F(TerminalTest, JsonKeepsTheExactNamesEscapedAsJson) {
    auto groups = Run("--formatter=json network vswitch standard portgroup list");
    ASSERT_EQ(groups.status, 0);
    EXPECT_FALSE(HasRawControl(groups.out));
    bool found = false;
    for (const auto& group : json::parse(groups.out)) found = found || group["Name"] == kPortGroup;
    EXPECT_TRUE(found) << groups.out;

    auto vms = Run("--formatter=json network vm list");
    ASSERT_EQ(vms.status, 0);
    EXPECT_FALSE(HasRawControl(vms.out));
    EXPECT_NE(vms.out.find("web\\u001b[31m\\n-01"), std::string::npos) << vms.out;
}

TEST_F(TerminalTest, ErrorMessagesEchoingTextAreEscaped) {
    const std::string evil = "x\x1b[2J\x1b]0;t\x07\r\x9b";
    for (const auto& args : std::vector<std::vector<std::string>>{
             {"network", evil},                                                               // unknown word
             {"network", "nic", "list", "--" + evil},                                         // unknown option
             {"network", "nic", "list", evil},                                                // stray word
             {"network", "nic", "get", "-n", evil},                                           // host's message
             {"network", "vswitch", "standard", "portgroup", "remove", "-p", evil, "-v", "vSwitch1"},
             {"network", "ip", "interface", "add", "-i", evil},                               // pattern
             {"network", "nic", "set", "-n", "vmnic0", "--speed", evil},                      // not an integer
             {"network", "ip", "dns", "search", "add", "-d", evil},
         }) {
        auto r = Run(args);
        EXPECT_NE(r.status, 0);
        EXPECT_FALSE(r.err.empty());
        EXPECT_FALSE(HasRawControl(r.err)) << Zorbel::Format::TerminalSafe(r.err);
        // The text is still recognisable in the message.
        EXPECT_NE(r.err.find("x\\x1b[2J"), std::string::npos) << Zorbel::Format::TerminalSafe(r.err);
    }
    // A crafted name from the state in a message: the port group is removed, then removed again.
    auto r = Run(std::vector<std::string>{"network", "vswitch", "standard", "portgroup", "remove", "-p", kPortGroup,
                                          "-v", "vSwitch0"});
    EXPECT_EQ(r.status, 1);
    EXPECT_FALSE(HasRawControl(r.err)) << Zorbel::Format::TerminalSafe(r.err);
}

// --- end to end ---

struct Output {
    int status = -1;
    std::string out, err;
};

std::string ReadAll(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), {});
}

Output Spawn(const std::string& program, std::vector<std::string> args, const std::string& dir) {
    pid_t pid = fork();
    if (pid == 0) {
        int out = open((dir + "/out").c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
        int err = open((dir + "/err").c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
        dup2(out, 1);
        dup2(err, 2);
        std::vector<char*> argv{const_cast<char*>(program.c_str())};
        for (auto& arg : args) argv.push_back(arg.data());
        argv.push_back(nullptr);
        execv(program.c_str(), argv.data());
        _exit(127);
    }
    int status = 0;
    waitpid(pid, &status, 0);
    return {WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status), ReadAll(dir + "/out"),
            ReadAll(dir + "/err")};
}

TEST_F(TerminalTest, EndToEndThroughHadrocli) {
    auto dir = std::filesystem::temp_directory_path() / ("hadro-terminal-" + std::to_string(getpid()));
    std::filesystem::create_directories(dir);
    const std::string state = (dir / "host.json").string(), crafted = (dir / "crafted.json").string();
    std::ofstream(crafted) << Export();
    ASSERT_EQ(Spawn(HADROSIM, {"--state=" + state, "import", crafted}, dir).status, 0);

    for (const char* formatter : {"--formatter=simple", "--formatter=table", "--formatter=json"}) {
        for (auto words : std::vector<std::vector<std::string>>{{"network", "vswitch", "standard", "portgroup", "list"},
                                                                {"network", "vm", "list"}}) {
            words.insert(words.begin(), {"--state=" + state, formatter});
            auto r = Spawn(HADROCLI, words, dir);
            EXPECT_EQ(r.status, 0) << r.err;
            EXPECT_FALSE(HasRawControl(r.out)) << formatter;
            EXPECT_TRUE(r.out.find("PG\\x1b[2J") != std::string::npos || r.out.find("PG\\u001b[2J") != std::string::npos ||
                        r.out.find("web\\x1b[31m") != std::string::npos || r.out.find("web\\u001b[31m") != std::string::npos)
                << r.out;
        }
    }
    auto refused = Spawn(HADROCLI, {"--state=" + state, "network", "nic", "get", "-n", "\x1b[2J\x07"}, dir);
    EXPECT_EQ(refused.status, 1);
    EXPECT_FALSE(HasRawControl(refused.err)) << refused.err.size();
    auto unknown = Spawn(HADROCLI, {"--state=" + state, "--\x1b[2J"}, dir);
    EXPECT_EQ(unknown.status, 2);
    EXPECT_FALSE(HasRawControl(unknown.err));
    std::filesystem::remove_all(dir);
}

}  // namespace

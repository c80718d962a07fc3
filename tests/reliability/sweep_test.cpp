// Bad input everywhere: every registered command (from the command list and each command's
// JSON help), every parameter, with values of the wrong type, out of range, empty, huge,
// with control characters and with invalid UTF-8, plus malformed command lines. Whatever
// the input: the status is 0, 1 or 2, a refused command line (2) leaves the host as it was,
// and nothing on stdout or stderr carries a raw control character.
//
// The sweep runs in-process (fast; under the sanitizers in the sanitizer build); a sample of
// it runs again through hadrocli as a process on a state file.
#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iostream>
#include <limits>
#include <map>
#include <nlohmann/json.hpp>
#include <sstream>

#include "harness.h"
#include "zorbel/formatter.h"

namespace {

using nlohmann::json;

struct Parameter {
    std::string name;
    std::string shortName;
    std::string type;  // string, integer, boolean, flag, string-list
    bool required = false;
    json constraint;
};

struct Command {
    std::vector<std::string> words;
    std::vector<Parameter> parameters;
    std::string Path() const {
        std::string path;
        for (const auto& word : words)
            path += (path.empty() ? "" : " ") + word;
        return path;
    }
};

// One command line of the sweep and what it tries.
struct Case {
    std::vector<std::string> args;
    std::string what;
};

// A value the host of the default state accepts, by parameter name, so that the other
// required parameters do not stop a command line before the value under test is looked at.
std::string GoodValue(const Parameter& p) {
    static const std::map<std::string, std::string> known = {
        {"vswitch-name", "vSwitch0"},
        {"portgroup-name", "VM Network"},
        {"interface-name", "tkn0"},
        {"nic-name", "vmnic0"},
        {"vmnic", "vmnic0"},
        {"netstack", "defaultTcpipStack"},
        {"dvs", "dvs-prod"},
        {"dvs-name", "dvs-prod"},
        {"ruleset-id", "webAccess"},
        {"server", "192.0.2.99"},
        {"domain", "example.org"},
        {"ip-address", "192.0.2.77"},
        {"gateway", "192.0.2.1"},
        {"network", "10.9.0.0/16"},
        {"ipv4", "192.0.2.50"},
        {"netmask", "255.255.255.0"},
        {"ipv6", "2001:db8::5/64"},
        {"mac-address", "02:00:00:00:00:99"},
        {"module", "hadrofw"},
        {"switch", "vSwitch0"},
        {"uplink-name", "vmnic1"},
        {"tagname", "Management"},
        {"wake-on-lan", "g"},
        {"file", "/dev/null"},
        {"neighbor-addr", "192.0.2.1"},
        {"world-id", "2110231"},
        {"sa-name", "sa1"},
        {"sp-name", "sp1"},
        {"sa-source", "192.0.2.10"},
        {"sa-destination", "192.0.2.20"},
        {"sp-source", "192.0.2.0/24"},
        {"sp-destination", "198.51.100.0/24"},
        {"sa-spi", "0x1000"},
        {"integrity-key", "0x0123456789abcdef0123456789abcdef01234567"},
        {"name", "new-instance"},
        {"plugin", "load-based"},
        {"qbr", "qbr0"},
    };
    if (auto it = known.find(p.name); it != known.end()) return it->second;
    const auto& c = p.constraint;
    if (c.is_object() && c.value("kind", "") == "enum" && !c["values"].empty()) {
        const auto& first = c["values"][0];
        return first.is_object() ? first["value"].get<std::string>() : std::to_string(first.get<long long>());
    }
    if (c.is_object() && c.value("kind", "") == "range") return std::to_string(c["min"].get<long long>());
    if (p.type == "integer") return "1";
    if (p.type == "boolean") return "true";
    return "x";
}

// The values tried for a parameter of that type.
std::vector<std::pair<std::string, std::string>> BadValues(const Parameter& p) {
    static const std::string huge(1 << 20, 'A');
    static const std::string hugeDigits(1 << 20, '7');
    std::vector<std::pair<std::string, std::string>> values = {
        {"", "empty"},
        {huge, "1 MiB"},
        {std::string("a\x1b[2J\x1b]0;title\x07\rb\n\tc\x7f\x9b", 16), "control characters"},
        {std::string("\xff\xfe\xc0\xaf\xed\xa0\x80\xf4\x90\x80\x80", 11), "invalid UTF-8"},
        {std::string("a\0b", 3), "embedded NUL"},
        {"-", "a dash"},
        {"--", "two dashes"},
    };
    if (p.type == "integer") {
        for (const char* text :
             {"abc", "1.5", "0x10", "1e3", " 1", "1 ", "+", "99999999999999999999", "-99999999999999999999",
              "9223372036854775807", "-9223372036854775808", "2147483648", "-1", "0"}) {
            values.emplace_back(text, "integer edge");
        }
        values.emplace_back(hugeDigits, "1 MiB of digits");
        const auto& c = p.constraint;
        if (c.is_object() && c.value("kind", "") == "range") {
            long long low = c["min"].get<long long>(), high = c["max"].get<long long>();
            if (low > std::numeric_limits<long long>::min())
                values.emplace_back(std::to_string(low - 1), "below range");
            if (high < std::numeric_limits<long long>::max())
                values.emplace_back(std::to_string(high + 1), "above range");
        }
    } else if (p.type == "boolean") {
        for (const char* text : {"maybe", "2", "TRUE ", "yes please", "tru"})
            values.emplace_back(text, "not a boolean");
    } else if (p.type == "string") {
        for (const char* text : {"nonexistent", "tkn256", "256.1.1.1", "::g", "0.0.0.0/33", "vmnic0 ",
                                 "../../etc/passwd", "%s%n%x", "'; rm -rf /"}) {
            values.emplace_back(text, "unknown or malformed");
        }
    }
    return values;
}

class SweepTest : public Hadro::Test::CommandTest {
protected:
    void SetUp() override {
        CommandTest::SetUp();
        defaultHost_ = Export();
    }

    std::vector<Command> Commands() {
        auto list = Run(std::vector<std::string>{"--formatter=json", "--list-commands"});
        EXPECT_EQ(list.status, 0);
        std::vector<Command> commands;
        for (const auto& entry : json::parse(list.out)) {
            Command command;
            std::istringstream words(entry["path"].get<std::string>());
            for (std::string word; words >> word;)
                command.words.push_back(word);
            auto args = command.words;
            args.insert(args.begin(), "--formatter=json");
            args.push_back("--help");
            auto help = Run(args);
            EXPECT_EQ(help.status, 0) << command.Path();
            const json description = json::parse(help.out);
            for (const auto& p : description["parameters"]) {
                command.parameters.push_back({p["name"], p.value("short", ""), p["type"], p["required"],
                                              p.contains("constraint") ? p["constraint"] : json()});
            }
            commands.push_back(command);
        }
        return commands;
    }

    // A command line: the command's words, the value under test for parameter at, and good
    // values for the other required parameters.
    static std::vector<std::string> Line(const Command& command, std::size_t at, const std::string& value,
                                         bool shortForm) {
        std::vector<std::string> args = command.words;
        for (std::size_t i = 0; i < command.parameters.size(); ++i) {
            const auto& p = command.parameters[i];
            if (i == at) {
                if (p.type == "flag") {
                    args.push_back("--" + p.name + "=" + value);
                } else if (shortForm && !p.shortName.empty()) {
                    args.push_back("-" + p.shortName);
                    args.push_back(value);
                } else {
                    args.push_back("--" + p.name + "=" + value);
                }
            } else if (p.required && p.type != "flag") {
                args.push_back("--" + p.name);
                args.push_back(GoodValue(p));
            }
        }
        return args;
    }

    static std::vector<Case> Cases(const std::vector<Command>& commands) {
        std::vector<Case> cases;
        for (const auto& command : commands) {
            for (std::size_t i = 0; i < command.parameters.size(); ++i) {
                const auto& p = command.parameters[i];
                bool shortForm = false;
                for (const auto& [value, what] : BadValues(p)) {
                    cases.push_back({Line(command, i, value, shortForm), "--" + p.name + ": " + what});
                    shortForm = !shortForm;
                }
                // The good value itself, and the option given twice.
                cases.push_back({Line(command, i, GoodValue(p), false), "--" + p.name + ": good value"});
                auto twice = Line(command, i, GoodValue(p), false);
                twice.push_back(twice[command.words.size()]);
                cases.push_back({twice, "--" + p.name + " twice"});
                // The option as the last word, without its value.
                auto missing = command.words;
                missing.push_back("--" + p.name);
                cases.push_back({missing, "--" + p.name + " without a value"});
            }
            auto base = Line(command, command.parameters.size(), "", false);
            cases.push_back({base, "required options only"});
            for (const char* extra :
                 {"stray", "--no-such-option", "-Z", "--", "---x", "-", "--=x", "\x1b[31m"}) {
                auto args = base;
                args.push_back(extra);
                cases.push_back({args, std::string("extra word ") + extra});
            }
        }
        return cases;
    }

    std::string defaultHost_;
};

// The bytes a terminal would act on: C0 controls but newline and tab, DEL, C1 controls
// (as UTF-8) and bytes that are not UTF-8. Returns a description of the first, or "".
std::string RawControl(const std::string& text) {
    const auto* bytes = reinterpret_cast<const unsigned char*>(text.data());
    for (std::size_t i = 0; i < text.size();) {
        unsigned char c = bytes[i];
        if (c < 0x80) {
            if ((c < 0x20 && c != '\n' && c != '\t') || c == 0x7f)
                return "byte " + std::to_string(c) + " at " + std::to_string(i);
            ++i;
            continue;
        }
        std::size_t length = c >= 0xf0 ? 4 : c >= 0xe0 ? 3 : c >= 0xc2 ? 2 : 0;
        if (length == 0 || i + length > text.size())
            return "stray byte " + std::to_string(c) + " at " + std::to_string(i);
        for (std::size_t k = 1; k < length; ++k) {
            if ((bytes[i + k] & 0xc0) != 0x80)
                return "stray byte " + std::to_string(c) + " at " + std::to_string(i);
        }
        if (c == 0xc2 && bytes[i + 1] < 0xa0) return "C1 control at " + std::to_string(i);
        i += length;
    }
    return {};
}

std::string Shown(const std::vector<std::string>& args) {
    std::string text;
    for (const auto& arg : args) {
        std::string shown =
            arg.size() > 40 ? arg.substr(0, 40) + "...(" + std::to_string(arg.size()) + " bytes)" : arg;
        text += (text.empty() ? "" : " ") + Zorbel::Format::TerminalSafe(shown);
    }
    return text;
}

TEST_F(SweepTest, EveryCommandAndParameterTakesBadInputSafely) {
    auto commands = Commands();
    ASSERT_GE(commands.size(), 142u);
    auto cases = Cases(commands);
    std::map<int, int> statuses;
    for (const auto& c : cases) {
        auto r = Run(c.args);
        ++statuses[r.status];
        const std::string where = Shown(c.args) + " (" + c.what + ")";
        EXPECT_TRUE(r.status == 0 || r.status == 1 || r.status == 2)
            << where << " exited " << r.status << ": " << r.err;
        EXPECT_EQ(RawControl(r.err), "") << where << " stderr: " << Zorbel::Format::TerminalSafe(r.err);
        EXPECT_EQ(RawControl(r.out), "") << where << " stdout";
        if (r.status == 2) {
            EXPECT_FALSE(session_->HasChanges()) << where << " was refused but changed the host";
            EXPECT_TRUE(r.out.empty()) << where;
        }
        // Each command line starts from the default host.
        if (session_->HasChanges()) UseHost(defaultHost_);
    }
    RecordProperty("cases", static_cast<int>(cases.size()));
    std::cout << "[ sweep    ] " << commands.size() << " commands, " << cases.size()
              << " command lines: " << statuses[0] << " exit 0, " << statuses[1] << " exit 1, " << statuses[2]
              << " exit 2\n";
}

// --- the same through hadrocli, on a sample ---

struct Process {
    int status = -1;
    std::string out;
    std::string err;
};

std::string ReadAll(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), {});
}

Process RunHadrocli(const std::vector<std::string>& args, const std::string& dir) {
    const std::string outPath = dir + "/out", errPath = dir + "/err";
    pid_t pid = fork();
    if (pid == 0) {
        int out = open(outPath.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
        int err = open(errPath.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
        dup2(out, 1);
        dup2(err, 2);
        std::vector<char*> argv;
        static std::string program = HADROCLI;
        argv.push_back(program.data());
        std::vector<std::string> copy = args;
        for (auto& arg : copy)
            argv.push_back(arg.data());
        argv.push_back(nullptr);
        execv(program.c_str(), argv.data());
        _exit(127);
    }
    Process p;
    int status = 0;
    waitpid(pid, &status, 0);
    p.status = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    p.out = ReadAll(outPath);
    p.err = ReadAll(errPath);
    return p;
}

TEST_F(SweepTest, SampleThroughHadrocli) {
    auto commands = Commands();
    auto cases = Cases(commands);
    // One argument of a command line may not exceed 128 KiB (the kernel's limit): cut the
    // huge values to just under it.
    constexpr std::size_t kMaxArgument = 128 * 1024 - 64;
    auto dir = std::filesystem::temp_directory_path() / ("hadro-sweep-" + std::to_string(getpid()));
    std::filesystem::create_directories(dir);
    const std::string state = (dir / "host.json").string();
    ASSERT_EQ(RunHadrocli({"--state=" + state, "network", "ip", "get"}, dir).status, 0);
    std::string before = ReadAll(state);
    // Every SWEEP_PROCESS_STEP-th case (a prime): each kind of value, spread over the commands.
    std::size_t step = SWEEP_PROCESS_STEP, runs = 0;
    for (std::size_t i = 0; i < cases.size(); i += step) {
        auto args = cases[i].args;
        for (auto& arg : args) {
            if (arg.size() > kMaxArgument) arg.resize(kMaxArgument);
            // An argument of a process ends at a NUL byte.
            if (auto nul = arg.find('\0'); nul != std::string::npos) arg.resize(nul);
        }
        args.insert(args.begin(), "--state=" + state);
        auto r = RunHadrocli(args, dir.string());
        ++runs;
        const std::string where = Shown(args) + " (" + cases[i].what + ")";
        EXPECT_TRUE(r.status == 0 || r.status == 1 || r.status == 2)
            << where << " exited " << r.status << ": " << r.err;
        EXPECT_EQ(RawControl(r.err), "") << where;
        EXPECT_EQ(RawControl(r.out), "") << where;
        std::string after = ReadAll(state);
        if (r.status == 2) {
            EXPECT_EQ(after, before) << where << " was refused but changed the state file";
        }
        before = after;
    }
    std::cout << "[ sweep    ] " << runs << " command lines through hadrocli\n";
    std::filesystem::remove_all(dir);
}

}  // namespace

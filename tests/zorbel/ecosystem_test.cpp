// hadrocli on the real network commands, as a process on a scratch state file: the machine
// formats, the completion script run by bash, the man page and the command reference.
#include <gtest/gtest.h>

#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <string>

namespace {

struct Result {
    int status = -1;
    std::string out;
};

// Runs a shell command line; stdout only.
Result Shell(const std::string& command) {
    Result result;
    FILE* pipe = popen(command.c_str(), "r");
    if (!pipe) return result;
    char buffer[4096];
    std::size_t n;
    while ((n = fread(buffer, 1, sizeof buffer, pipe)) > 0)
        result.out.append(buffer, n);
    int status = pclose(pipe);
    result.status = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    return result;
}

std::string State() {
    static std::string path = [] {
        std::string p = ::testing::TempDir() + "ecosystem_host_" + std::to_string(getpid()) + ".json";
        std::remove(p.c_str());
        return p;
    }();
    return path;
}

// hadrocli with the scratch state.
Result Hadrocli(const std::string& arguments) {
    return Shell(std::string(HADROCLI) + " --state=" + State() + " " + arguments + " 2>&1");
}

// What the bash completion offers for the words given (the last one is completed). Words are
// bash text, quoted as needed.
std::string Complete(const std::string& words) {
    std::string script = "source <(\"$0\" --completion bash) || exit 9; COMP_WORDS=(\"$0\" --state=\"$1\" " +
                         words +
                         "); COMP_CWORD=$((${#COMP_WORDS[@]} - 1)); _hadrocli; for w in \"${COMPREPLY[@]}\"; "
                         "do printf '%s|' \"$w\"; done";
    std::string command = "bash -c '";
    for (char c : script)
        command += c == '\'' ? std::string("'\\''") : std::string(1, c);
    command += "' " + std::string(HADROCLI) + " " + State() + " 2>&1";
    return Shell(command).out;
}

TEST(Formats, RealCommandsInEveryMachineFormat) {
    auto r = Hadrocli("--formatter=csv --format-param fields=Name,Link\\ Status network nic list");
    EXPECT_EQ(r.status, 0) << r.out;
    EXPECT_EQ(r.out.substr(0, r.out.find("vmnic2")), "Name,Link Status\r\nvmnic0,Up\r\nvmnic1,Up\r\n")
        << r.out;

    r = Hadrocli("--formatter=keyvalue network ip interface list | grep '^[^=]*\\.Name=' | cut -d= -f2-");
    EXPECT_EQ(r.out.substr(0, 10), "tkn0\ntkn1\n");

    // Every record kind of a few commands parses as XML.
    if (Shell("python3 -c 'import xml.dom.minidom' 2>/dev/null").status == 0) {
        for (const char* path :
             {"network nic list", "network vswitch standard list", "network ip interface list",
              "network firewall ruleset list", "network ip route ipv4 list"}) {
            r = Hadrocli(
                std::string("--formatter=xml ") + path +
                " | python3 -c 'import sys, xml.dom.minidom; xml.dom.minidom.parse(sys.stdin.buffer)'");
            EXPECT_EQ(r.status, 0) << path << ": " << r.out;
        }
    }
    // A name with markup and quotes survives each format.
    r = Hadrocli("network vswitch standard portgroup add -p '<a & \"b\">' -v vSwitch1");
    EXPECT_EQ(r.status, 0) << r.out;
    r = Hadrocli("--formatter=xml network vswitch standard portgroup list");
    EXPECT_NE(r.out.find("<string>&lt;a &amp; &quot;b&quot;&gt;</string>"), std::string::npos) << r.out;
    r = Hadrocli("--formatter=csv --format-param fields=Name network vswitch standard portgroup list");
    EXPECT_NE(r.out.find("\r\n\"<a & \"\"b\"\">\"\r\n"), std::string::npos) << r.out;
}

TEST(Completion, BashCompletesTheTreeOptionsValuesAndHostNames) {
    EXPECT_EQ(Complete("''"), "network|");
    EXPECT_NE(Complete("network ip interface ''").find("list|"), std::string::npos);
    EXPECT_EQ(Complete("--form"), "--formatter|--format-param|");
    EXPECT_EQ(Complete("--formatter=k"), "--formatter=keyvalue|");
    // Readline splits words at '=': only the value is replaced.
    EXPECT_EQ(Complete("--formatter = k"), "keyvalue|");
    EXPECT_EQ(Complete("--backend=''"), "--backend=simulated|--backend=linux|");
    // Options not given yet; values of enumerations and booleans.
    std::string options = Complete("network ip interface set --interface-name tkn0 --");
    EXPECT_EQ(options.find("--interface-name|"), std::string::npos) << options;
    EXPECT_NE(options.find("--mtu|"), std::string::npos) << options;
    EXPECT_EQ(Complete("network ip interface set --enabled ''"), "true|false|");
    // Names from the host, escaped for the shell; short options too.
    EXPECT_EQ(Complete("network ip interface set -i tk").substr(0, 10), "tkn0|tkn1|");
    EXPECT_EQ(Complete("network nic get --nic-name=vmnic1"), "--nic-name=vmnic1|");
    EXPECT_EQ(Complete("network vswitch standard portgroup remove --portgroup-name Man"),
              "Management\\ Network|");
    EXPECT_EQ(Complete("network vswitch standard portgroup remove --portgroup-name '\"Man'"),
              "Management Network|");
    EXPECT_EQ(Hadrocli("network vswitch standard portgroup add -p 'it'\\''s \"x\"' -v vSwitch1").status, 0);
    EXPECT_EQ(Complete("network vswitch standard portgroup remove --portgroup-name it"),
              "it\\\'s\\ \\\"x\\\"|");
    // Unknown words complete to nothing.
    EXPECT_EQ(Complete("network nosuch ''"), "");
}

// The zsh script's walk over the words, run by zsh with the completion builtins standing in:
// compadd prints what it is given.
std::string CompleteZsh(const std::string& words) {
    std::string script =
        "compadd() { while [[ $1 == -* && $1 != -- ]]; do [[ $1 == -[Sd] ]] && shift; shift; done; "
        "[[ $1 == -- ]] && shift; for w in \"$@\"; do printf '%s|' \"$w\"; done; }; compset() { :; }; "
        "compdef() { :; }; source <(\"$0\" --completion zsh) || exit 9; words=(\"$0\" --state=\"$1\" " +
        words + "); CURRENT=${#words}; _hadrocli";
    std::string command = "zsh -f -c '";
    for (char c : script)
        command += c == '\'' ? std::string("'\\''") : std::string(1, c);
    command += "' " + std::string(HADROCLI) + " " + State() + " 2>&1";
    return Shell(command).out;
}

TEST(Completion, ZshCompletesTheSameWay) {
    if (Shell("command -v zsh >/dev/null").status != 0) GTEST_SKIP() << "no zsh";
    EXPECT_EQ(CompleteZsh("''"), "network|");
    EXPECT_EQ(CompleteZsh("--formatter ''"), "simple|table|json|xml|csv|keyvalue|");
    EXPECT_EQ(CompleteZsh("--backend ''"), "simulated|linux|");
    EXPECT_EQ(CompleteZsh("network ip interface set --interface-name tkn0 --"), "--enabled|--mtu|");
    EXPECT_EQ(CompleteZsh("network ip interface set --enabled ''"), "true|false|");
    EXPECT_EQ(CompleteZsh("network ip interface set -i ''").substr(0, 10), "tkn0|tkn1|");
    EXPECT_NE(CompleteZsh("network vswitch standard portgroup remove --portgroup-name=M")
                  .find("Management Network|"),
              std::string::npos);
}

TEST(Manual, ManPageAndReferenceCoverEveryCommand) {
    auto list = Shell(std::string(HADROCLI) + " --list-commands | cut -f1");
    auto man = Shell(std::string(HADROCLI) + " --manual");
    auto reference = Shell(std::string(HADROCLI) + " --manual=markdown");
    ASSERT_EQ(man.status, 0);
    EXPECT_EQ(man.out.rfind(".\\\" Written by hadrocli --manual", 0), 0u);
    std::size_t start = 0, count = 0;
    while (start < list.out.size()) {
        std::size_t end = list.out.find('\n', start);
        std::string path = list.out.substr(start, end - start);
        EXPECT_NE(man.out.find(".SS \"hadrocli " + path + "\"\n"), std::string::npos) << path;
        EXPECT_NE(reference.out.find("\n## hadrocli " + path + "\n"), std::string::npos) << path;
        ++count;
        start = end + 1;
    }
    EXPECT_GT(count, 100u);
    // man renders it without a warning.
    if (Shell("command -v groff >/dev/null").status == 0) {
        auto warnings = Shell(std::string(HADROCLI) + " --manual | groff -man -Tutf8 -ww -z 2>&1");
        EXPECT_EQ(warnings.out, "");
    }
    // Parameters with their type, notes and expanded descriptions.
    EXPECT_NE(reference.out.find("`--interface-name` (string, required): "), std::string::npos);
}

}  // namespace

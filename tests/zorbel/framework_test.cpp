// The framework end to end: the test plug-in's commands run through the real parser,
// help and formatters, in-process and through hadrocli.
#include <gtest/gtest.h>

#include <sys/wait.h>
#include <cstdio>
#include <sstream>

#include "zorbel/dispatcher.h"
#include "zorbel/formatter.h"

namespace {

using namespace Zorbel::AutoCli;

struct Result {
    int status = -1;
    std::string out;
    std::string err;
};

std::shared_ptr<Dispatcher> Framework() {
    static std::shared_ptr<Dispatcher> dispatcher = [] {
        auto d = Dispatcher::New("hadrocli");
        std::ostringstream ignored;
        d->LoadPluginDirectories({TEST_PLUGIN_DIR}, ignored);
        return d;
    }();
    return dispatcher;
}

Result Cli(const std::vector<std::string>& args) {
    Result result;
    GlobalOptions options;
    std::vector<std::string> rest;
    std::string error;
    std::ostringstream out, err;
    if (!ParseGlobalOptions(args, options, rest, error)) {
        result.status = EXIT_REFUSED;
        result.err = error;
        return result;
    }
    result.status = Framework()->Run(rest, options, out, err);
    result.out = out.str();
    result.err = err.str();
    return result;
}

// Runs hadrocli as a process with the test plug-ins.
Result RunProcess(const std::string& arguments) {
    Result result;
    std::string errFile = ::testing::TempDir() + "zorbel_stderr.txt";
    std::string command =
        std::string(HADROCLI) + " --plugin-dir=" + TEST_PLUGIN_DIR + " " + arguments + " 2>" + errFile;
    FILE* pipe = popen(command.c_str(), "r");
    char buffer[4096];
    std::size_t n;
    while ((n = fread(buffer, 1, sizeof buffer, pipe)) > 0)
        result.out.append(buffer, n);
    int status = pclose(pipe);
    result.status = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    FILE* errPipe = fopen(errFile.c_str(), "r");
    while (errPipe && (n = fread(buffer, 1, sizeof buffer, errPipe)) > 0)
        result.err.append(buffer, n);
    if (errPipe) fclose(errPipe);
    return result;
}

std::vector<std::string> Show(std::initializer_list<std::string> options) {
    std::vector<std::string> args{"--formatter=json", "test", "types", "show"};
    args.insert(args.end(), options);
    return args;
}

}  // namespace

TEST(CommandLine, EveryTypeAndSyntaxIsParsed) {
    auto r = Cli(Show({"--name=x y", "-c", "5", "--level", "2", "-C=red", "-i", "tkn255", "--enabled=YES",
                       "-a", "--item", "a", "-I=b", "--offset", "-9223372036854775808"}));
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(
        r.out,
        "{\"name\":\"x y\",\"count\":\"5\",\"level\":\"2\",\"color\":\"red\",\"interface\":\"tkn255\","
        "\"enabled\":\"true\",\"all\":\"set\",\"offset\":\"-9223372036854775808\",\"item\":[\"a\",\"b\"]}\n");
    EXPECT_EQ(r.err, "");

    // Absent parameters read as empty, 0, false, unset; booleans take every spelling.
    r = Cli(Show({"--enabled", "off", "--count=+7", "--name="}));
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_NE(r.out.find("\"name\":\"\",\"count\":\"7\",\"level\":\"<absent>\""), std::string::npos) << r.out;
    EXPECT_NE(r.out.find("\"enabled\":\"false\",\"all\":\"unset\""), std::string::npos) << r.out;
    for (const char* spelling : {"true", "On", "1", "yes", "FALSE", "no", "0", "oFF"}) {
        EXPECT_EQ(Cli(Show({"-e", spelling})).status, 0) << spelling;
    }
}

TEST(CommandLine, RefusalsNameTheOptionAndRunNothing) {
    struct Case {
        std::vector<std::string> options;
        std::string message;
    };
    const std::vector<Case> cases{
        {{"--bogus=1"}, "Error: unknown option --bogus"},
        {{"-q"}, "Error: unknown option -q"},
        {{"--name", "a", "-n", "b"}, "Error: option --name is given more than once"},
        {{"--name"}, "Error: option --name needs a value"},
        {{"--name", "--count=1"}, "Error: option --name needs a value"},
        {{"stray"}, "Error: unexpected argument 'stray'"},
        {{"--count", "99999999999999999999"},
         "Error: option --count: '99999999999999999999' does not fit in a 64-bit integer"},
        {{"--offset", "12x"}, "Error: option --offset: '12x' is not an integer"},
        {{"--offset="}, "Error: option --offset: '' is not an integer"},
        {{"--offset", " 1"}, "Error: option --offset: ' 1' is not an integer"},
        {{"--enabled=maybe"},
         "Error: option --enabled: 'maybe' is not a boolean (use true/false, yes/no, on/off or 1/0)"},
        {{"--count", "11"}, "Error: option --count: 11 is not within the range 1 to 10"},
        {{"-c", "0"}, "Error: option --count: 0 is not within the range 1 to 10"},
        {{"--level", "4"}, "Error: option --level: 4 is not one of the allowed values: 1, 2, 3"},
        {{"--color", "Red"}, "Error: option --color: 'Red' is not one of the allowed values: red, blue"},
        {{"-i", "tkn256"},
         "Error: option --interface: 'tkn256' does not match the required pattern "
         "tkn([0-9]|[1-9][0-9]|1[0-9][0-9]|2[0-4][0-9]|25[0-5])"},
        {{"-i", "xtkn1"},
         "Error: option --interface: 'xtkn1' does not match the required pattern "
         "tkn([0-9]|[1-9][0-9]|1[0-9][0-9]|2[0-4][0-9]|25[0-5])"},
        {{"--all=true"}, "Error: option --all is a flag and takes no value"},
        {{"--formatter=json"}, "Error: unknown option --formatter (global options go before the first word)"},
    };
    for (const auto& c : cases) {
        auto r = Cli(Show(std::initializer_list<std::string>{}));
        std::vector<std::string> args{"test", "types", "show"};
        args.insert(args.end(), c.options.begin(), c.options.end());
        r = Cli(args);
        EXPECT_EQ(r.status, EXIT_REFUSED) << c.message;
        EXPECT_EQ(r.out, "");
        EXPECT_EQ(
            r.err,
            c.message +
                "\nUsage: hadrocli test types show [options]; see 'hadrocli test types show --help'.\n");
    }
    auto r = Cli({"test", "types", "set", "--value", "3"});
    EXPECT_EQ(r.status, EXIT_REFUSED);
    EXPECT_EQ(r.err.substr(0, r.err.find('\n')), "Error: missing required option --name");
}

TEST(CommandLine, PathsNamespacesAndGlobalOptions) {
    auto r = Cli({"test", "nothing"});
    EXPECT_EQ(r.status, EXIT_REFUSED);
    EXPECT_EQ(r.err,
              "Error: Unknown command or namespace 'nothing' in 'test'. Valid choices: types, record, "
              "scalar, fail.\n"
              "Usage: hadrocli test [options]; see 'hadrocli test --help'.\n");

    // A path that ends at a namespace lists it: exit 0 with --help, else 2.
    r = Cli({"test", "types", "--help"});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(
        r.out,
        "Usage: hadrocli test types {cmd} [cmd options]\n\nDescription:\n  Parameter types.\n\n"
        "Available Commands:\n  show   Show the parsed value of every parameter.\n  set    Needs a name.\n");
    r = Cli({"test", "types"});
    EXPECT_EQ(r.status, EXIT_REFUSED);
    EXPECT_EQ(r.out, "");
    EXPECT_NE(r.err.find("Available Commands:"), std::string::npos);

    r = Cli({"--formatter=json", "test", "--help"});
    EXPECT_EQ(
        r.out,
        "{\"path\":\"test\",\"description\":\"Commands that exercise the framework.\",\"namespaces\":["
        "{\"name\":\"types\",\"description\":\"Parameter types.\"},{\"name\":\"record\",\"description\":"
        "\"Records.\"},{\"name\":\"scalar\",\"description\":\"Scalars.\"},{\"name\":\"fail\",\"description\":"
        "\"Failures.\"}],\"commands\":[]}\n");

    r = Cli({"--formatter=xmlish", "test"});
    EXPECT_EQ(r.status, EXIT_REFUSED);
    EXPECT_EQ(
        r.err,
        "unknown formatter 'xmlish' for --formatter (choose from simple, table, json, xml, csv, keyvalue)");
    EXPECT_EQ(Cli({"--state"}).status, EXIT_REFUSED);
    EXPECT_EQ(Cli({"--what"}).err, "unknown global option --what");

    r = Cli({});
    EXPECT_EQ(r.status, EXIT_REFUSED);
    EXPECT_NE(r.err.find("Usage: hadrocli [global options]"), std::string::npos);
    r = Cli({"--help"});
    EXPECT_EQ(r.status, 0);
    EXPECT_NE(r.out.find("Available Namespaces:\n  test   Commands that exercise the framework.\n"),
              std::string::npos);
}

TEST(CommandLine, ListCommandsInRegistrationOrder) {
    auto r = Cli({"--list-commands"});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out.substr(0, r.out.find('\n', r.out.find('\n') + 1) + 1),
              "test types show\tShow the parsed value of every parameter.\n"
              "test types set\tNeeds a name.\n");
    EXPECT_NE(r.out.find("test fail plain\tDerived without a virtual base.\n"), std::string::npos);
    r = Cli({"--formatter=json", "--list-commands"});
    EXPECT_EQ(
        r.out.rfind("[{\"path\":\"test types show\",\"description\":\"Show the parsed value of every", 0),
        0u);
    EXPECT_EQ(r.out.substr(r.out.size() - 3), "}]\n");
}

TEST(Help, CommandHelpAsTextAndJson) {
    auto r = Cli({"test", "types", "show", "--help"});
    EXPECT_EQ(r.status, 0);
    EXPECT_NE(r.out.find("  -l|--level=<integer>\n        Level : [1, 2, 3]\n"), std::string::npos) << r.out;
    EXPECT_NE(r.out.find("  -C|--color=<string>\n        Colour. Available colours are\n"
                         "          red: The colour red\n          blue\n"),
              std::string::npos)
        << r.out;
    EXPECT_NE(r.out.find("  -c|--count=<integer>  (1 to 10)\n"), std::string::npos);
    EXPECT_NE(r.out.find("  -a|--all\n"), std::string::npos);
    EXPECT_NE(r.out.find("  -I|--item=<string-list>  (may be repeated)\n"), std::string::npos);
    EXPECT_NE(r.out.find("Output:\n  record Parsed\n     name: string\n"), std::string::npos) << r.out;

    // Help wins over everything else on the line, even invalid options.
    EXPECT_EQ(Cli({"test", "types", "set", "--bogus", "-h"}).status, 0);
    EXPECT_EQ(Cli({"--help", "test", "types", "set"}).status, 0);

    r = Cli({"--formatter=json", "test", "types", "set", "--help"});
    EXPECT_EQ(r.out,
              "{\"path\":\"test types set\",\"description\":\"Needs a name.\",\"parameters\":["
              "{\"name\":\"name\",\"short\":\"n\",\"type\":\"string\",\"required\":true,\"description\":"
              "\"The name.\"},"
              "{\"name\":\"value\",\"short\":\"v\",\"type\":\"integer\",\"required\":false,\"description\":"
              "\"The value.\"}"
              "],\"output\":{\"kind\":\"boolean\"},\"metadata\":{\"type\":\"operation\"},\"formatter\":\"\","
              "\"output-parameters\":[]}\n");
    r = Cli({"--formatter=json", "test", "types", "show", "--help"});
    for (const char* piece : {
             "{\"name\":\"count\",\"short\":\"c\",\"type\":\"integer\",\"required\":false,\"description\":"
             "\"A count.\","
             "\"constraint\":{\"kind\":\"range\",\"min\":1,\"max\":10}}",
             "\"description\":\"Level : [1, 2, 3]\",\"constraint\":{\"kind\":\"enum\",\"values\":[1,2,3]}}",
             "\"description\":\"Colour. Available colours are \\n    red: The colour red\\n    "
             "blue\",\"constraint\":"
             "{\"kind\":\"enum\",\"values\":[{\"value\":\"red\",\"help\":\"The colour "
             "red\"},{\"value\":\"blue\","
             "\"help\":\"\"}]}}",
             "\"constraint\":{\"kind\":\"regex\",\"pattern\":\"tkn([0-9]|[1-9][0-9]|1[0-9][0-9]|2[0-4][0-9]|"
             "25[0-5])\"}}",
             "{\"name\":\"all\",\"short\":\"a\",\"type\":\"flag\"",
             "{\"name\":\"item\",\"short\":\"I\",\"type\":\"string-list\"",
             "\"output\":{\"kind\":\"record\",\"record\":\"Parsed\",\"fields\":[{\"name\":\"name\",\"type\":"
             "\"string\"}",
             "{\"name\":\"item\",\"type\":\"string-list\"}]}",
         }) {
        EXPECT_NE(r.out.find(piece), std::string::npos) << piece << "\n" << r.out;
    }
}

TEST(Formatters, SimpleRecordWithNestedValuesAndUnits) {
    auto r = Cli({"test", "record", "get"});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out,
              "Name: alpha\n"
              "MTU: 9000\n"
              "Enabled: true\n"
              "Servers: 10.0.0.1, 10.0.0.2\n"
              "Link:\n"
              "   Speed: 1000\n"
              "   Duplex: Full\n"
              "Ports:\n"
              "   Id: 1\n"
              "   State: up\n"
              "\n"
              "   Id: 2\n"
              "   State: up\n"
              "Timeout: 30 sec\n");
}

TEST(Formatters, SimpleListWithHeadingsAndChosenFields) {
    auto r = Cli({"test", "record", "list"});
    EXPECT_EQ(
        r.out,
        "alpha\n   Name: alpha\n   MTU: 1400 bytes\n   Enabled: false\n   Servers: 10.0.0.1, 10.0.0.2\n\n"
        "b\n   Name: b\n   MTU: 1500 bytes\n   Enabled: false\n   Servers: 10.0.0.1, 10.0.0.2\n");
    // An empty list is a valid result and prints nothing.
    r = Cli({"test", "record", "list", "--count", "0"});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, "");
}

TEST(Formatters, Table) {
    auto r = Cli({"--formatter=table", "test", "record", "list", "--count=3"});
    EXPECT_EQ(r.out,
              "Name             MTU         Enabled  Servers\n"
              "---------------  ----------  -------  ------------------\n"
              "alpha            1400 bytes  false    10.0.0.1, 10.0.0.2\n"
              "b                1500 bytes  false    10.0.0.1, 10.0.0.2\n"
              "gamma-long-name  1600 bytes  true     10.0.0.1, 10.0.0.2\n");
    // The command's own default formatter; its table-columns; the last column wrapped.
    setenv("COLUMNS", "20", 1);
    r = Cli({"test", "record", "table"});
    unsetenv("COLUMNS");
    EXPECT_EQ(r.out,
              "Key    Text\n"
              "-----  -------------\n"
              "short  one two\n"
              "k      the quick\n"
              "       brown fox\n"
              "       jumps over\n"
              "       the lazy dog\n");
    r = Cli({"--formatter=table", "test", "record", "get"});
    EXPECT_NE(r.out.find("Ports"), std::string::npos);
    EXPECT_NE(r.out.find("Id: 1, State: up; Id: 2, State: up"), std::string::npos) << r.out;
}

TEST(Formatters, JsonKeepsEveryFieldAndEscapes) {
    auto r = Cli({"--formatter=json", "test", "record", "list", "--count=1"});
    EXPECT_EQ(r.out,
              "[{\"Name\":\"alpha\",\"MTU\":1400,\"Enabled\":false,\"Servers\":[\"10.0.0.1\",\"10.0.0.2\"],"
              "\"Link\":{\"Speed\":1000,\"Duplex\":\"Full\"},\"Ports\":[{\"Id\":1,\"State\":\"up\"},"
              "{\"Id\":2,\"State\":\"up\"}],\"Timeout\":30}]\n");
    EXPECT_EQ(Cli({"--formatter=json", "test", "scalar", "raw"}).out,
              "\"tab\\there \\u001b[31m\\ufffd end\"\n");
    EXPECT_EQ(Cli({"--formatter=json", "test", "scalar", "strings"}).out, "[\"a\",\"b\\\"c\"]\n");
}

TEST(Formatters, TextFromTheHostCannotDriveTheTerminal) {
    // Control characters and stray bytes are shown as escapes by simple and table; JSON escapes
    // them its own way.
    EXPECT_EQ(Cli({"test", "scalar", "raw"}).out, "tab\\there \\x1b[31m\\xff end\n");
    EXPECT_EQ(Zorbel::Format::TerminalSafe("a\r\nb\x7f\xc2\x9b[2J\xc3\xa9"),
              "a\\r\\nb\\x7f\\u009b[2J\xc3\xa9");
    EXPECT_EQ(Zorbel::Format::TerminalSafe("plain text"), "plain text");
    std::string json;
    Zorbel::Format::AppendJsonString(json, "\xc2\x9b\xe2\x82");
    EXPECT_EQ(json, "\"\\u009b\\ufffd\\ufffd\"");
}

TEST(Formatters, Scalars) {
    EXPECT_EQ(Cli({"test", "scalar", "int"}).out, "-42\n");
    EXPECT_EQ(Cli({"--formatter=table", "test", "scalar", "string"}).out, "vSwitch0\n");
    EXPECT_EQ(Cli({"test", "scalar", "strings"}).out, "a\nb\"c\n");
    auto r = Cli({"test", "scalar", "true"});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, "");
    r = Cli({"test", "scalar", "false"});
    EXPECT_EQ(r.status, EXIT_FAILED);
    EXPECT_EQ(r.out, "false\n");
    EXPECT_EQ(Cli({"--formatter=json", "test", "scalar", "true"}).out, "true\n");
}

TEST(Results, ErrorsAndExitStatus) {
    auto r = Cli({"test", "types", "set", "--name", "ok"});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out + r.err, "");

    r = Cli({"test", "types", "set", "-n", "bad"});
    EXPECT_EQ(r.status, EXIT_FAILED);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.err, "Unable to find the thing named bad\n");

    // A root set together with errors is still printed; messages keep their order.
    r = Cli({"--formatter=json", "test", "types", "set", "-n", "twice"});
    EXPECT_EQ(r.status, EXIT_FAILED);
    EXPECT_EQ(r.out, "true\n");
    EXPECT_EQ(r.err, "first problem\nsecond problem\n");

    r = Cli({"test", "types", "set", "-n", "no"});
    EXPECT_EQ(r.status, EXIT_FAILED);
    EXPECT_EQ(r.out, "false\n");

    EXPECT_EQ(Cli({"test", "fail", "plain"}).status, 0);
}

TEST(Results, EscapingExceptionsAreReportedNotFatal) {
    auto r = Cli({"test", "fail", "throw"});
    EXPECT_EQ(r.status, EXIT_UNEXPECTED);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.err, "Error: unexpected failure in 'test fail throw': disk on fire\n");
    r = Cli({"test", "fail", "throw-other"});
    EXPECT_EQ(r.status, EXIT_UNEXPECTED);
    EXPECT_EQ(r.err, "Error: unexpected failure in 'test fail throw-other'\n");
}

TEST(Plugins, ABrokenPluginBesideAGoodOne) {
    auto dispatcher = Dispatcher::New();
    std::ostringstream err;
    EXPECT_EQ(dispatcher->LoadPluginDirectories({TEST_PLUGIN_DIR, "/nonexistent"}, err), 1);
    std::string text = err.str();
    EXPECT_NE(text.find("Warning: plug-in " TEST_PLUGIN_DIR "/garbage.so not loaded: "), std::string::npos)
        << text;
    EXPECT_NE(text.find("Warning: plug-in " TEST_PLUGIN_DIR "/no_entry.so not loaded: it has no entry point "
                        "AutoCli_RegisterNamespaces\n"),
              std::string::npos)
        << text;
    EXPECT_TRUE(dispatcher->GetRoot()->HasNamespaceNode("test"));
}

TEST(Process, HadrocliRunsCommandsAndReportsStatus) {
    auto r = RunProcess("test types set --name ok");
    EXPECT_EQ(r.status, 0);
    EXPECT_NE(r.err.find("garbage.so not loaded"), std::string::npos);
    r = RunProcess("--formatter=json test scalar int");
    EXPECT_EQ(r.out, "-42\n");
    r = RunProcess("test types show --count 11");
    EXPECT_EQ(r.status, 2);
    EXPECT_NE(r.err.find("Error: option --count: 11 is not within the range 1 to 10\n"), std::string::npos);
    EXPECT_EQ(RunProcess("test fail throw").status, 3);
    EXPECT_EQ(RunProcess("test types set -n bad").status, 1);
    r = RunProcess("--version");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out.rfind("hadrocli ", 0), 0u);
}

// The xml, csv and keyvalue formatters and the user's display parameters (--format-param),
// on the test plug-in's commands through the real parser.
#include <gtest/gtest.h>

#include <sstream>

#include "zorbel/dispatcher.h"

namespace {

using namespace Zorbel::AutoCli;

struct Result {
    int status = -1;
    std::string out;
    std::string err;
};

Result Cli(const std::vector<std::string>& args) {
    static std::shared_ptr<Dispatcher> dispatcher = [] {
        auto d = Dispatcher::New("hadrocli");
        std::ostringstream ignored;
        d->LoadPluginDirectories({TEST_PLUGIN_DIR}, ignored);
        return d;
    }();
    Result result;
    GlobalOptions options;
    std::vector<std::string> rest;
    std::ostringstream out, err;
    if (!ParseGlobalOptions(args, options, rest, result.err)) {
        result.status = EXIT_REFUSED;
        return result;
    }
    result.status = dispatcher->Run(rest, options, out, err);
    result.out = out.str();
    result.err = err.str();
    return result;
}

// A record whose name field holds the given text.
std::vector<std::string> Named(const std::string& formatter, const std::string& name) {
    return {"--formatter=" + formatter,
            "--format-param",
            "fields=name,item",
            "test",
            "types",
            "show",
            "--name",
            name,
            "--item",
            "x",
            "--item",
            "y, z"};
}

TEST(Csv, ColumnsOfTheTableQuotingAndLineEnds) {
    // The command's own columns (the missing one skipped), values without units, CRLF.
    auto r = Cli({"--formatter=csv", "test", "record", "list"});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out,
              "Name,MTU,Enabled,Servers\r\n"
              "alpha,1400,false,\"10.0.0.1, 10.0.0.2\"\r\n"
              "b,1500,false,\"10.0.0.1, 10.0.0.2\"\r\n");
    // Quotes doubled; commas, line breaks and edge blanks quoted; controls replaced.
    r = Cli(Named("csv", "a,\"b\"\nc"));
    EXPECT_EQ(r.out, "name,item\r\n\"a,\"\"b\"\"\nc\",\"x, y, z\"\r\n");
    EXPECT_EQ(Cli(Named("csv", " pad")).out, "name,item\r\n\" pad\",\"x, y, z\"\r\n");
    EXPECT_EQ(Cli({"--formatter=csv", "test", "scalar", "raw"}).out,
              "tab\there \xEF\xBF\xBD[31m\xEF\xBF\xBD end\r\n");
    // Scalars and lists of strings: one field per line; a boolean is a value.
    EXPECT_EQ(Cli({"--formatter=csv", "test", "scalar", "strings"}).out, "a\r\n\"b\"\"c\"\r\n");
    EXPECT_EQ(Cli({"--formatter=csv", "test", "scalar", "false"}).out, "false\r\n");
    // An empty list still has its header; show-header=false drops it.
    EXPECT_EQ(Cli({"--formatter=csv", "test", "record", "list", "--count=0"}).out,
              "Name,MTU,Enabled,Servers\r\n");
    r = Cli({"--formatter=csv", "--format-param=show-header=no", "--format-param=fields=MTU,Name", "test",
             "record", "list"});
    EXPECT_EQ(r.out, "1400,alpha\r\n1500,b\r\n");
}

TEST(KeyValue, OneLinePerValueEscapedAndGrepable) {
    auto r = Cli({"--formatter=keyvalue", "test", "record", "get"});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out,
              "Host.Name=alpha\nHost.MTU=9000\nHost.Enabled=true\nHost.Servers=10.0.0.1\n"
              "Host.Servers=10.0.0.2\nHost.Link.Speed=1000\nHost.Link.Duplex=Full\nHost.Ports.Id=1\n"
              "Host.Ports.State=up\nHost.Ports.Id=2\nHost.Ports.State=up\nHost.Timeout=30\n");
    // Records of a list are separated by a blank line; the user's fields, in their order.
    r = Cli({"--formatter=keyvalue", "--format-param", "fields=MTU,Name", "test", "record", "list"});
    EXPECT_EQ(r.out, "Host.MTU=1400\nHost.Name=alpha\n\nHost.MTU=1500\nHost.Name=b\n");
    // Nothing can break a line or reach the terminal raw; printf %b gives the bytes back.
    EXPECT_EQ(Cli({"--formatter=keyvalue", "test", "scalar", "raw"}).out, "tab\\there \\x1b[31m\\xff end\n");
    EXPECT_EQ(Cli(Named("keyvalue", "a\\n=b\r\n\xC2\x9B")).out,
              "Parsed.name=a\\\\n=b\\r\\n\\xc2\\x9b\nParsed.item=x\nParsed.item=y, z\n");
    EXPECT_EQ(Cli({"--formatter=keyvalue", "test", "scalar", "int"}).out, "-42\n");
    EXPECT_EQ(Cli({"--formatter=keyvalue", "test", "scalar", "true"}).out, "true\n");
}

TEST(Xml, TypedWellFormedAndEscaped) {
    auto r = Cli({"--formatter=xml", "--format-param=fields=Name,Link,Ports", "test", "record", "get"});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out,
              "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<output>\n"
              "  <record name=\"Host\">\n"
              "    <field name=\"Name\"><string>alpha</string></field>\n"
              "    <field name=\"Link\">\n"
              "      <record name=\"Link\">\n"
              "        <field name=\"Speed\"><integer>1000</integer></field>\n"
              "        <field name=\"Duplex\"><string>Full</string></field>\n"
              "      </record>\n"
              "    </field>\n"
              "    <field name=\"Ports\">\n"
              "      <list>\n"
              "        <record name=\"Port\">\n"
              "          <field name=\"Id\"><integer>1</integer></field>\n"
              "          <field name=\"State\"><string>up</string></field>\n"
              "        </record>\n"
              "        <record name=\"Port\">\n"
              "          <field name=\"Id\"><integer>2</integer></field>\n"
              "          <field name=\"State\"><string>up</string></field>\n"
              "        </record>\n"
              "      </list>\n"
              "    </field>\n"
              "  </record>\n</output>\n");
    // Markup escaped; tab, CR and LF as references; other C0 controls, U+FFFE and bad bytes
    // replaced (XML 1.0 cannot hold them); DEL and C1 as references.
    r = Cli(Named("xml", "<a & 'b'>\t\r\n\x01\x7f\xC2\x85\xEF\xBF\xBE\xff]]>"));
    EXPECT_NE(r.out.find("<string>&lt;a &amp; &apos;b&apos;&gt;&#9;&#13;&#10;\xEF\xBF\xBD&#x7F;&#x85;"
                         "\xEF\xBF\xBD\xEF\xBF\xBD]]&gt;</string>"),
              std::string::npos)
        << r.out;
    EXPECT_EQ(
        Cli({"--formatter=xml", "test", "scalar", "false"}).out,
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<output>\n  <boolean>false</boolean>\n</output>\n");
    EXPECT_EQ(Cli({"--formatter=xml", "test", "record", "list", "--count=0"}).out,
              "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<output>\n  <list/>\n</output>\n");
}

TEST(Csv, CommandListing) {
    auto r = Cli({"--formatter=csv", "--list-commands"});
    EXPECT_EQ(r.out.substr(0, r.out.find("test types set")),
              "path,description\r\ntest types show,Show the parsed value of every parameter.\r\n");
    r = Cli({"--formatter=keyvalue", "--format-param=fields=path", "--list-commands"});
    EXPECT_EQ(r.out.substr(0, 58), "Command.path=test types show\n\nCommand.path=test types set\n");
}

// Every byte value, alone and in the sequences a careless escaper gets wrong.
std::string AllBytes() {
    std::string text;
    for (int c = 1; c < 256; ++c)
        text += static_cast<char>(c);
    return text +
           "\xC2\x9B\xC2\xA0\xE2\x82\xAC\xEF\xBF\xBF\xF0\x9F\x98\x80\xED\xA0\x80\xC0\xAF\xF4\x90\x80\x80";
}

bool WellFormedUtf8WithoutControls(const std::string& text, const std::string& allowed) {
    for (std::size_t i = 0; i < text.size();) {
        auto c = static_cast<unsigned char>(text[i]);
        if (c < 0x80) {
            if ((c < 0x20 || c == 0x7f) && allowed.find(static_cast<char>(c)) == std::string::npos)
                return false;
            ++i;
            continue;
        }
        std::size_t length = c >= 0xF0 ? 4 : c >= 0xE0 ? 3 : c >= 0xC2 ? 2 : 0;
        if (length == 0 || i + length > text.size()) return false;
        for (std::size_t k = 1; k < length; ++k)
            if ((static_cast<unsigned char>(text[i + k]) & 0xC0) != 0x80) return false;
        if (length == 2 && c == 0xC2 && static_cast<unsigned char>(text[i + 1]) < 0xA0) return false;  // C1
        i += length;
    }
    return true;
}

TEST(Escaping, AnyBytesStaySafeAndKeyValueGivesThemBack) {
    const std::string name = AllBytes();
    auto r =
        Cli({"--formatter=keyvalue", "--format-param=fields=name", "test", "types", "show", "--name", name});
    ASSERT_EQ(r.out.rfind("Parsed.name=", 0), 0u);
    std::string line = r.out.substr(12, r.out.size() - 13);
    EXPECT_EQ(line.find('\n'), std::string::npos);
    EXPECT_TRUE(WellFormedUtf8WithoutControls(line, ""));
    std::string decoded;  // what printf '%b' does with the escapes
    for (std::size_t i = 0; i < line.size(); ++i) {
        if (line[i] != '\\') {
            decoded += line[i];
            continue;
        }
        char e = line[++i];
        if (e == 'x') {
            decoded += static_cast<char>(std::stoi(line.substr(i + 1, 2), nullptr, 16));
            i += 2;
        } else {
            decoded += e == 'n' ? '\n' : e == 'r' ? '\r' : e == 't' ? '\t' : e;
        }
    }
    EXPECT_EQ(decoded, name);

    for (const char* formatter : {"xml", "csv", "simple", "table", "json"}) {
        r = Cli({std::string("--formatter=") + formatter, "test", "types", "show", "--name", name});
        EXPECT_TRUE(WellFormedUtf8WithoutControls(r.out, "\n\r\t")) << formatter;
    }
}

TEST(FormatParameters, ChooseFieldsHideHeadersAndRefuseMistakes) {
    // fields over the command's own choice, for every formatter, json included.
    EXPECT_EQ(Cli({"--format-param=fields=Timeout,Name", "test", "record", "get"}).out,
              "Timeout: 30 sec\nName: alpha\n");
    EXPECT_EQ(
        Cli({"--formatter=json", "--format-param=fields=MTU,Name", "test", "record", "list", "--count=1"})
            .out,
        "[{\"MTU\":1400,\"Name\":\"alpha\"}]\n");
    EXPECT_EQ(Cli({"--formatter=table", "--format-param=show-header=false", "--format-param=fields=Name,MTU",
                   "test", "record", "list", "--count=3"})
                  .out,
              "alpha            1400 bytes\nb                1500 bytes\ngamma-long-name  1600 bytes\n");
    // The command's own parameters can still be overridden by key.
    EXPECT_EQ(Cli({"--format-param=fields:Host=Name", "test", "record", "list", "--count=1"}).out,
              "alpha\n   Name: alpha\n");

    struct Case {
        std::vector<std::string> args;
        int status;
        std::string err;
    };
    const std::vector<Case> refusals{
        {{"--format-param=colour=red", "test", "record", "get"},
         EXIT_REFUSED,
         "unknown display parameter 'colour' for --format-param (choose from fields, show-header, "
         "table-columns, "
         "wrap-last, fields:RECORD, header:RECORD, units:RECORD.FIELD, table-columns:RECORD)"},
        {{"--format-param=show-header=maybe", "test", "record", "get"},
         EXIT_REFUSED,
         "--format-param show-header: 'maybe' is not a boolean (true or false)"},
        {{"--format-param=fields=Name,,MTU", "test", "record", "get"},
         EXIT_REFUSED,
         "--format-param fields: an empty field name in 'Name,,MTU'"},
        {{"--format-param=fields=Name,Nmae", "test", "record", "list"},
         EXIT_REFUSED,
         "Error: --format-param fields: 'Nmae' is not a field of Host (fields: Name, MTU, Enabled, Servers, "
         "Link, "
         "Ports, Timeout)\nUsage: hadrocli test record list [options]; see 'hadrocli test record list "
         "--help'.\n"},
        {{"--format-param=fields=Name", "test", "types", "set", "-n", "x"},
         EXIT_REFUSED,
         "Error: --format-param fields: this command's result has no fields\n"
         "Usage: hadrocli test types set [options]; see 'hadrocli test types set --help'.\n"},
        {{"--completion=fish"},
         EXIT_REFUSED,
         "unknown shell 'fish' for --completion (choose from bash, zsh)"},
        {{"--manual=html"},
         EXIT_REFUSED,
         "unknown manual format 'html' for --manual (choose from man, markdown)"},
        {{"--formatter=yaml", "test", "record", "get"},
         EXIT_REFUSED,
         "unknown formatter 'yaml' for --formatter (choose from simple, table, json, xml, csv, keyvalue)"},
    };
    for (const auto& c : refusals) {
        auto r = Cli(c.args);
        EXPECT_EQ(r.status, c.status) << c.args[0];
        EXPECT_EQ(r.err, c.err) << c.args[0];
        EXPECT_EQ(r.out, "") << c.args[0];
    }
}

}  // namespace

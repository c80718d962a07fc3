// The firewall's ruleset catalogue: the shipped rulesets and the files that extend them.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>

#include "hostctl/session.h"
#include "system/firewall_catalogue.h"

namespace {

using HostCtl::Lib::StateFileError;
using TknCtl::Linux::FirewallCatalogue;

// The message a text is refused with; empty when it is taken.
std::string Refusal(const std::string& text, FirewallCatalogue catalogue = FirewallCatalogue::Shipped()) {
    try {
        catalogue.Extend(text, "/etc/hadro/firewall.d/site.json");
    } catch (const StateFileError& e) {
        return e.what();
    }
    return {};
}

TEST(FirewallCatalogue, TheShippedRulesetsCoverTheDefaultHostAndALinuxHost) {
    auto catalogue = FirewallCatalogue::Shipped();
    for (const char* name : {"sshServer", "ntpClient", "webAccess", "dhcpClient", "glidex", "syslogRelay",
                             "dns", "dhcpv6Client", "ntpServer", "nfsClient"})
        EXPECT_TRUE(catalogue.Find(name)) << name;
    const auto* ssh = catalogue.Find("sshServer");
    ASSERT_TRUE(ssh);
    EXPECT_TRUE(ssh->enabled);
    EXPECT_TRUE(ssh->allowedAll);
    EXPECT_EQ(ssh->rules, (std::vector<TknCtl::Linux::Kernel::NftRule>{{1, 22, 22, 0, 0}}));
    EXPECT_FALSE(catalogue.Find("webAccess")->enabled);
    EXPECT_EQ(catalogue.Find("syslogRelay")->rules[1].portEnd, 1520u);
    for (const auto& ruleset : catalogue.rulesets) {
        EXPECT_TRUE(TknCtl::Linux::IsRulesetName(ruleset.name)) << ruleset.name;
        EXPECT_FALSE(ruleset.rules.empty()) << ruleset.name;
        EXPECT_TRUE(ruleset.origin.empty());
    }
}

TEST(FirewallCatalogue, AFileAddsRulesetsAndReplacesShippedOnesInPlace) {
    auto catalogue = FirewallCatalogue::Shipped();
    const std::size_t shipped = catalogue.rulesets.size();
    catalogue.Extend(R"({"rulesets": [
        {"name": "sshServer", "allowedAll": false, "allowedIps": ["192.0.2.9/24", "2001:db8::1/128"],
         "rules": [{"direction": "inbound", "protocol": "tcp", "portBegin": 2222}]},
        {"name": "backupAgent", "enabled": true,
         "rules": [{"direction": "outbound", "protocol": "udp", "portType": "src", "portBegin": 9000, "portEnd": 9010}]}]})",
                     "a.json");
    ASSERT_EQ(catalogue.rulesets.size(), shipped + 1);
    const auto& ssh = catalogue.rulesets[0];
    EXPECT_EQ(ssh.name, "sshServer");
    EXPECT_EQ(ssh.origin, "a.json");
    EXPECT_FALSE(ssh.allowedAll);
    EXPECT_FALSE(ssh.enabled);
    EXPECT_EQ(ssh.allowedIps, (std::vector<std::string>{"192.0.2.0/24", "2001:db8::1"}));
    EXPECT_EQ(ssh.rules[0].portBegin, 2222u);
    const auto& backup = catalogue.rulesets.back();
    EXPECT_EQ(backup.name, "backupAgent");
    EXPECT_EQ(backup.rules, (std::vector<TknCtl::Linux::Kernel::NftRule>{{0, 9000, 9010, 1, 1}}));

    // A name another file defines already is refused, naming both files.
    EXPECT_EQ(Refusal(R"({"rulesets": [{"name": "backupAgent",
        "rules": [{"direction": "inbound", "protocol": "tcp", "portBegin": 1}]}]})",
                      catalogue),
              "firewall rulesets /etc/hadro/firewall.d/site.json: ruleset 'backupAgent' is defined in a.json "
              "already");
}

TEST(FirewallCatalogue, AMalformedFileIsRefusedWithItsNameAndLine) {
    const std::string head = "firewall rulesets /etc/hadro/firewall.d/site.json: line ";
    EXPECT_EQ(Refusal("{\"rulesets\": [\n  {\"name\": \"x\",,}\n]}").substr(0, head.size() + 2), head + "2:");
    EXPECT_EQ(Refusal(""), head +
                               "1: syntax error while parsing value - unexpected end of input; expected '[', "
                               "'{', or a literal");
    EXPECT_EQ(
        Refusal("{\"rulesets\": [\n {\"name\": \"a\",\n  \"rules\": [\n   {\"direction\": \"inbound\",\n"
                "    \"protocol\": \"tcp\",\n    \"portBegin\": 70000\n   }]}]}"),
        head + "6: ruleset 'a': rule 1: \"portBegin\" is a port from 1 to 65535");
    EXPECT_EQ(Refusal("{\"rulesets\": [\n {\"name\": \"a\", \"colour\": 1,\n \"rules\": []}]}"),
              head +
                  "2: ruleset 1: unknown member \"colour\" (known: name, description, enabled, allowedAll, "
                  "allowedIps, rules)");
    EXPECT_EQ(Refusal("{\"rulesets\": [\n {\"name\": \"a\"}]}"),
              head + "2: ruleset 'a' has no list \"rules\" with at least one rule");
    EXPECT_EQ(Refusal("{\"rulesets\": [{\"name\": \"input\", \"rules\": []}]}").substr(head.size() + 3, 17),
              "ruleset 'input': ");
    EXPECT_NE(Refusal("{\"rulesets\": [{\"name\": \"9lives\"}]}").find("a ruleset name is 1 to 48"),
              std::string::npos);
    EXPECT_EQ(
        Refusal("{\"rulesets\": [{\"name\": \"a\",\n \"allowedIps\": [\"10.0.0.0/8\",\n \"10.1.2.3\"]}]}"),
        head + "3: ruleset 'a': allowed entry 10.1.2.3 overlaps 10.0.0.0/8");
    EXPECT_EQ(
        Refusal(
            "{\"rulesets\": [{\"name\": \"a\", \"rules\": [{\"direction\": \"in\", \"protocol\": \"tcp\", "
            "\"portBegin\": 1}]}]}"),
        head + "1: ruleset 'a': rule 1: \"direction\" is \"inbound\" or \"outbound\"");
    EXPECT_EQ(
        Refusal("{\"rulesets\": [{\"name\": \"a\", \"rules\": [{\"direction\": \"inbound\", \"protocol\": "
                "\"tcp\", \"portBegin\": 9, \"portEnd\": 8}]}]}"),
        head + "1: ruleset 'a': rule 1: the port range ends before it begins");
    EXPECT_EQ(
        Refusal("{\"rulesets\": [{\"name\": \"a\", \"rules\": [{\"direction\": \"inbound\", \"protocol\": "
                "\"tcp\", \"portBegin\": 1}]},\n{\"name\": \"a\", \"rules\": []}]}"),
        head + "2: ruleset 'a' is defined twice");
    EXPECT_EQ(Refusal("[]"), head + "1: the file is not an object");
    EXPECT_EQ(Refusal("{}"), head + "1: the file has no list \"rulesets\"");
}

TEST(FirewallCatalogue, TheDirectoryIsReadInNameOrder) {
    std::string pattern = (std::filesystem::temp_directory_path() / "hadro-catalogue-XXXXXX").string();
    ASSERT_NE(mkdtemp(pattern.data()), nullptr);
    const std::string dir = pattern;
    auto write = [&](const std::string& name, const std::string& text) {
        std::ofstream(dir + "/" + name) << text;
    };
    auto rule = [](int port) {
        return "{\"rulesets\": [{\"name\": \"site\", \"rules\": [{\"direction\": \"inbound\", \"protocol\": "
               "\"tcp\", "
               "\"portBegin\": " +
               std::to_string(port) + "}]}]}";
    };
    write("20-site.json", rule(20));
    write("notes.txt", "not a ruleset");
    EXPECT_EQ(FirewallCatalogue::Load(dir).Find("site")->rules[0].portBegin, 20u);
    write("10-site.json", rule(10));
    try {
        FirewallCatalogue::Load(dir);
        ADD_FAILURE() << "two files define site";
    } catch (const StateFileError& e) {
        EXPECT_EQ(std::string(e.what()), "firewall rulesets " + dir +
                                             "/20-site.json: ruleset 'site' is defined in " + dir +
                                             "/10-site.json already");
    }
    std::filesystem::remove_all(dir);
    EXPECT_EQ(FirewallCatalogue::Load(dir).rulesets.size(), FirewallCatalogue::Shipped().rulesets.size());
}

}  // namespace

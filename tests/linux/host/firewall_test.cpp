// The firewall of the Linux host: the nftables table inet hadro agrees with what the commands
// show, and no other table is ever touched.
#include <dlfcn.h>
#include <limits.h>
#include <stdlib.h>
#include <sys/mount.h>

#include <fstream>
#include <map>
#include <sstream>

#include "namespace_host.h"

namespace {

using Hadro::Test::Has;
using Hadro::Test::Slurp;

using nlohmann::json;

// The table as nft lists it, taken apart.
struct Table {
    bool exists = false;
    std::string policy;                                    // of the input chain
    std::vector<std::string> input;                        // its rules, as nft prints them
    std::map<std::string, std::vector<json>> chains;       // the other chains' rules
    std::map<std::string, std::vector<std::string>> sets;  // elements as text
};

class FirewallTest : public Hadro::Test::NamespaceHostTest {
protected:
    Table Read() {
        Table table;
        auto result = Try("nft -j list table inet hadro");
        if (result.status != 0) return table;
        table.exists = true;
        const json listing = json::parse(result.out);
        for (const auto& item : listing["nftables"]) {
            if (item.contains("chain")) {
                const auto& chain = item["chain"];
                if (chain["name"] == "input") {
                    table.policy = chain["policy"];
                } else {
                    table.chains[chain["name"]];
                }
            } else if (item.contains("rule")) {
                const auto& rule = item["rule"];
                if (rule["chain"] == "input") {
                    table.input.push_back(rule["expr"].dump());
                } else {
                    table.chains[rule["chain"]].push_back(rule);
                }
            } else if (item.contains("set")) {
                auto& elements = table.sets[item["set"]["name"]];
                for (const auto& e : item["set"].value("elem", json::array()))
                    elements.push_back(e.is_string() ? e.get<std::string>()
                                                     : e["prefix"]["addr"].get<std::string>() + "/" +
                                                           e["prefix"]["len"].dump());
            }
        }
        return table;
    }

    // A rule of a ruleset's chain as "tcp dport 22 inbound [v4]".
    static std::string Describe(const json& rule) {
        std::string text;
        for (const auto& e : rule["expr"]) {
            if (!e.contains("match")) continue;
            const auto& payload = e["match"]["left"]["payload"];
            if (payload["field"] == "saddr") {
                text += payload["protocol"] == "ip" ? "[v4] " : "[v6] ";
            } else {
                text += payload["protocol"].get<std::string>() + " " + payload["field"].get<std::string>() +
                        " " + e["match"]["right"].dump() + " ";
            }
        }
        return text + rule.value("comment", "");
    }

    std::vector<std::string> RulesOf(const Table& table, const std::string& chain) {
        std::vector<std::string> out;
        for (const auto& rule : table.chains.at(chain))
            out.push_back(Describe(rule));
        return out;
    }

    void Foreign() {
        Sh("nft add table ip foreign && nft add chain ip foreign c '{ type filter hook input priority 10; "
           "policy drop; }'"
           " && nft add rule ip foreign c tcp dport 9 accept && nft add table inet other"
           " && nft add set inet other s '{ type ipv4_addr; elements = { 192.0.2.1 } }'");
        foreign_ = Sh("nft list table ip foreign; nft list table inet other");
    }
    void ExpectForeignKept(const std::string& step) {
        EXPECT_EQ(Sh("nft list table ip foreign; nft list table inet other"), foreign_) << step;
    }

    std::string foreign_;
};

TEST_F(FirewallTest, LoadGetSetAndUnloadAgreeWithTheTable) {
    EXPECT_EQ(Hadro("network firewall get").out, "Loaded: false\nEnabled: false\nDefaultAction: PASS\n");
    EXPECT_EQ(Hadro("network firewall set -e true").err, "Firewall module is not loaded\n");
    EXPECT_FALSE(Read().exists);

    ASSERT_EQ(Hadro("network firewall load").status, 0);
    EXPECT_EQ(Hadro("network firewall get").out, "Loaded: true\nEnabled: true\nDefaultAction: DROP\n");
    Table table = Read();
    ASSERT_TRUE(table.exists);
    EXPECT_EQ(table.policy, "drop");
    // Loopback, replies, ICMPv6, the rulesets enabled from the start, the dynamic rules.
    ASSERT_EQ(table.input.size(), 8u);
    EXPECT_EQ(table.input.back(), R"([{"jump":{"target":"runtime"}}])");
    EXPECT_EQ(RulesOf(table, "sshServer"), (std::vector<std::string>{"tcp dport 22 inbound"}));
    EXPECT_FALSE(table.chains.count("webAccess"));

    // Disabled: everything passes, and the default action waits in the document.
    ASSERT_EQ(Hadro("network firewall set -e false").status, 0);
    table = Read();
    EXPECT_EQ(table.policy, "accept");
    EXPECT_TRUE(table.input.empty());
    EXPECT_TRUE(table.chains.count("sshServer"));
    EXPECT_EQ(Hadro("network firewall get").out, "Loaded: true\nEnabled: false\nDefaultAction: DROP\n");
    EXPECT_EQ(Hadro("network firewall set -d false").err, "Default action already DROP\n");
    ASSERT_EQ(Hadro("network firewall set -d true").status, 0);
    EXPECT_EQ(Read().policy, "accept");
    EXPECT_NE(Slurp(document_).find("\"defaultAction\": \"PASS\""), std::string::npos);
    // Enabled with PASS and back to DROP in one command.
    ASSERT_EQ(Hadro("network firewall set -e true -d false").status, 0);
    table = Read();
    EXPECT_EQ(table.policy, "drop");
    EXPECT_EQ(table.input.size(), 8u);
    // Enabling twice says nothing; the action already in force is refused after the switch.
    EXPECT_EQ(Hadro("network firewall set -e true").status, 0);
    auto both = Hadro("network firewall set -e false -d false");
    EXPECT_EQ(both.err, "Default action already DROP\n");
    EXPECT_EQ(Read().policy, "accept");

    // Unloaded: the table goes; loaded again it comes back as it was.
    ASSERT_EQ(Hadro("network firewall ruleset set -r sshServer -e false").status, 0);
    ASSERT_EQ(Hadro("network firewall unload").status, 0);
    EXPECT_FALSE(Read().exists);
    EXPECT_EQ(Hadro("network firewall get").out, "Loaded: false\nEnabled: false\nDefaultAction: PASS\n");
    EXPECT_EQ(Hadro("network firewall unload").status, 0);
    ASSERT_EQ(Hadro("network firewall load").status, 0);
    table = Read();
    EXPECT_EQ(table.policy, "accept");
    EXPECT_TRUE(table.input.empty());
    EXPECT_FALSE(table.chains.count("sshServer"));
    EXPECT_TRUE(table.chains.count("dns"));
}

TEST_F(FirewallTest, RulesetsAreChainsAndTheirAllowedAddressesSets) {
    ASSERT_EQ(Hadro("network firewall load").status, 0);
    auto rulesets = HadroJson("network firewall ruleset list");
    Table table = Read();
    for (const auto& ruleset : rulesets)
        EXPECT_EQ(ruleset["Enabled"].get<bool>(), table.chains.count(ruleset["Name"]) == 1) << ruleset;

    // Rules of an enabled ruleset are read from its chain.
    EXPECT_EQ(RulesOf(table, "dhcpv6Client"),
              (std::vector<std::string>{"udp dport 546 inbound", "udp sport 547 outbound"}));
    EXPECT_EQ(HadroJson("network firewall ruleset rule list -r dhcpv6Client"), json::parse(R"([
        {"Ruleset":"dhcpv6Client","Port Type":"Dst","Port Begin":546,"Port End":546,"Direction":"Inbound","Protocol":"UDP"},
        {"Ruleset":"dhcpv6Client","Port Type":"Dst","Port Begin":547,"Port End":547,"Direction":"Outbound","Protocol":"UDP"}])"));
    EXPECT_EQ(HadroJson("network firewall ruleset rule list -r syslogRelay")[1]["Port End"], 1520);

    ASSERT_EQ(Hadro("network firewall ruleset set -r webAccess -a false -e true").status, 0);
    ASSERT_EQ(Hadro("network firewall ruleset allowedip add -r webAccess -i 198.51.100.7/24").status, 0);
    ASSERT_EQ(Hadro("network firewall ruleset allowedip add -r webAccess -i 2001:db8::1/128").status, 0);
    ASSERT_EQ(Hadro("network firewall ruleset allowedip add -r webAccess -i 192.0.2.9").status, 0);
    table = Read();
    EXPECT_EQ(table.sets["webAccess_v4"], (std::vector<std::string>{"192.0.2.9", "198.51.100.0/24"}));
    EXPECT_EQ(table.sets["webAccess_v6"], (std::vector<std::string>{"2001:db8::1"}));
    EXPECT_EQ(RulesOf(table, "webAccess"),
              (std::vector<std::string>{"[v4] tcp dport 443 inbound", "[v6] tcp dport 443 inbound",
                                        "[v4] tcp dport 80 inbound", "[v6] tcp dport 80 inbound"}));
    EXPECT_EQ(HadroJson("network firewall ruleset allowedip list -r webAccess"), json::parse(R"([
        {"Ruleset":"webAccess","Allowed IP Addresses":["192.0.2.9","2001:db8::1","198.51.100.0/24"]}])"));

    EXPECT_EQ(
        Hadro("network firewall ruleset allowedip add -r webAccess -i 198.51.100.200").err,
        "Cannot have 198.51.100.200 on the allowed list of ruleset 'webAccess' with 198.51.100.0/24: they "
        "overlap, and the kernel's address sets (nftables interval sets) cannot hold overlapping entries\n");
    EXPECT_EQ(Hadro("network firewall ruleset allowedip add -r webAccess -i 192.0.2.9/32").err,
              "'192.0.2.9/32' is already on the allowed list of ruleset 'webAccess'\n");
    EXPECT_NE(Hadro("network firewall ruleset allowedip add -r webAccess -i 192.0.2.0-9")
                  .err.find("Invalid allowed address '192.0.2.0-9'"),
              std::string::npos);
    ASSERT_EQ(Hadro("network firewall ruleset allowedip remove -r webAccess -i 198.51.100.0/24").status, 0);
    EXPECT_EQ(Read().sets["webAccess_v4"], (std::vector<std::string>{"192.0.2.9"}));
    EXPECT_EQ(Hadro("network firewall ruleset allowedip remove -r webAccess -i 198.51.100.0/24").err,
              "'198.51.100.0/24' is not on the allowed list of ruleset 'webAccess'\n");

    // All addresses again: no address match, the list kept for later.
    ASSERT_EQ(Hadro("network firewall ruleset set -r webAccess -a true").status, 0);
    table = Read();
    EXPECT_EQ(RulesOf(table, "webAccess"),
              (std::vector<std::string>{"tcp dport 443 inbound", "tcp dport 80 inbound"}));
    EXPECT_EQ(table.sets["webAccess_v4"], (std::vector<std::string>{"192.0.2.9"}));
    EXPECT_EQ(Hadro("network firewall ruleset set -r webAccess -a true").err, "Already allowed all ip\n");
    EXPECT_EQ(Hadro("network firewall ruleset allowedip add -r webAccess -i 192.0.2.1").err,
              "Couldn't update allowed ip list when allowed-all flag is true.\n");

    // Disabled, the chain goes and the list waits in the document.
    ASSERT_EQ(Hadro("network firewall ruleset set -r webAccess -e false -a false").status, 0);
    table = Read();
    EXPECT_FALSE(table.chains.count("webAccess"));
    EXPECT_FALSE(table.sets.count("webAccess_v4"));
    EXPECT_EQ(HadroJson("network firewall ruleset allowedip list -r webAccess")[0]["Allowed IP Addresses"],
              json::parse(R"(["192.0.2.9","2001:db8::1"])"));
    ASSERT_EQ(Hadro("network firewall ruleset set -r webAccess -e true").status, 0);
    EXPECT_EQ(Read().sets["webAccess_v6"], (std::vector<std::string>{"2001:db8::1"}));

    EXPECT_EQ(Hadro("network firewall ruleset list -r nosuch").err, "Ruleset Not Found: nosuch\n");
    EXPECT_EQ(Hadro("network firewall ruleset set -r nosuch -e true").err, "Invalid Ruleset Id.\n");
    EXPECT_EQ(Hadro("network firewall ruleset client get -r nosuch").err, "Invalid Ruleset Id.\n");
}

TEST_F(FirewallTest, ClientsKeepARulesetEnabled) {
    ASSERT_EQ(Hadro("network firewall load").status, 0);
    EXPECT_EQ(Hadro("network firewall ruleset client get -r glidex").out, "Ruleset Client Count: 0\n");
    EXPECT_EQ(Hadro("network firewall ruleset client remove -r glidex").err,
              "Ruleset 'glidex' has no clients\n");
    ASSERT_EQ(Hadro("network firewall ruleset client add -r glidex").status, 0);
    ASSERT_EQ(Hadro("network firewall ruleset client add -r glidex").status, 0);
    EXPECT_EQ(RulesOf(Read(), "glidex"),
              (std::vector<std::string>{"tcp dport 8000 inbound", "tcp sport 8000 outbound"}));
    ASSERT_EQ(Hadro("network firewall ruleset client remove -r glidex").status, 0);
    EXPECT_TRUE(Read().chains.count("glidex"));
    EXPECT_EQ(Hadro("network firewall ruleset client get -r glidex").out, "Ruleset Client Count: 1\n");
    ASSERT_EQ(Hadro("network firewall ruleset client remove -r glidex").status, 0);
    EXPECT_FALSE(Read().chains.count("glidex"));
}

TEST_F(FirewallTest, RefreshReadsTheConfigurationAgainAndKeepsDynamicRules) {
    ASSERT_EQ(Hadro("network firewall load").status, 0);
    // A rule added at run time, as another tool of the host would.
    Sh("nft add rule inet hadro runtime tcp dport 902 accept comment inbound");
    Sh("mkdir -p /etc/hadro/firewall.d && printf '%s' '{\"rulesets\": [{\"name\": \"backupAgent\", "
       "\"enabled\": true,"
       " \"rules\": [{\"direction\": \"inbound\", \"protocol\": \"tcp\", \"portBegin\": 9000, \"portEnd\": "
       "9010}]},"
       " {\"name\": \"sshServer\", \"enabled\": true, \"rules\": [{\"direction\": \"inbound\", \"protocol\": "
       "\"tcp\","
       " \"portBegin\": 2222}]}]}' > /etc/hadro/firewall.d/site.json");
    // Until the refresh the kernel's rules are the truth.
    EXPECT_EQ(HadroJson("network firewall ruleset rule list -r sshServer")[0]["Port Begin"], 22);
    ASSERT_EQ(Hadro("network firewall refresh").status, 0);
    Table table = Read();
    EXPECT_EQ(RulesOf(table, "runtime"), (std::vector<std::string>{"tcp dport 902 inbound"}));
    EXPECT_EQ(RulesOf(table, "sshServer"), (std::vector<std::string>{"tcp dport 2222 inbound"}));
    // A ruleset new to the configuration starts as its file says.
    EXPECT_EQ(RulesOf(table, "backupAgent"),
              (std::vector<std::string>{"tcp dport {\"range\":[9000,9010]} inbound"}));
    EXPECT_EQ(HadroJson("network firewall ruleset list -r backupAgent")[0]["Enabled"], true);

    // A malformed file is refused with its name and line, as the configuration is.
    Sh("printf '{\"rulesets\": [\\n  {\"name\": \"x\", \"rules\": 5}]}' > /etc/hadro/firewall.d/zz.json");
    auto broken = Hadro("network firewall ruleset list");
    EXPECT_EQ(broken.status, 3);
    EXPECT_NE(
        broken.err.find("firewall rulesets /etc/hadro/firewall.d/zz.json: line 2: ruleset 'x' has no list "
                        "\"rules\" with at least one rule\n"),
        std::string::npos)
        << broken.err;
    // So is a name nft's language has a word for: the table could not be read back from its listing.
    Sh("printf '{\"rulesets\": [\\n  {\"name\": \"accept\", \"rules\": [{\"direction\": \"inbound\", "
       "\"protocol\": "
       "\"tcp\", \"portBegin\": 1}]}]}' > /etc/hadro/firewall.d/zz.json");
    broken = Hadro("network firewall ruleset list");
    EXPECT_EQ(broken.status, 3);
    EXPECT_NE(broken.err.find("zz.json: line 2: ruleset 'accept': the name is a word of nft's language"),
              std::string::npos)
        << broken.err;
    EXPECT_TRUE(Read().chains.count("backupAgent"));
}

TEST_F(FirewallTest, NoOtherTableIsEverTouched) {
    Foreign();
    for (const char* command :
         {"network firewall get", "network firewall load", "network firewall set -e false",
          "network firewall set -e true -d true", "network firewall refresh", "network firewall ruleset list",
          "network firewall ruleset set -r ntpClient -e true -a false",
          "network firewall ruleset allowedip add -r ntpClient -i 192.0.2.1",
          "network firewall ruleset allowedip list",
          "network firewall ruleset allowedip remove -r ntpClient -i 192.0.2.1",
          "network firewall ruleset rule list", "network firewall ruleset client add -r dns",
          "network firewall ruleset client get -r dns", "network firewall ruleset client remove -r dns",
          "network firewall unload", "network firewall load", "network firewall unload"}) {
        auto result = Hadro(command);
        EXPECT_EQ(result.status, 0) << command << "\n" << result.All();
        ExpectForeignKept(command);
    }
}

TEST_F(FirewallTest, TheFirewallNeedsRootAndLibnftables) {
    ASSERT_EQ(Hadro("network firewall load").status, 0);
    const std::string table = Sh("nft list table inet hadro");
    const std::string needsRoot =
        "The firewall of this Linux host is read and changed only by root (CAP_NET_ADMIN): the kernel shows "
        "its "
        "nftables to no other user\n";
    EXPECT_EQ(HadroUnprivileged("network firewall get").err, "Unable to get firewall status.\n" + needsRoot);
    EXPECT_EQ(HadroUnprivileged("network firewall set -e false").err, needsRoot);
    EXPECT_EQ(HadroUnprivileged("network firewall unload").err, needsRoot);
    EXPECT_EQ(HadroUnprivileged("network firewall ruleset set -r dns -e false").err, needsRoot);
    EXPECT_EQ(Sh("nft list table inet hadro"), table);

    // The library is loaded when the firewall is first used; without it the firewall is refused.
    void* library = dlopen("libnftables.so.1", RTLD_NOW | RTLD_LOCAL);
    ASSERT_NE(library, nullptr);
    Dl_info info{};
    ASSERT_NE(dladdr(dlsym(library, "nft_ctx_new"), &info), 0);
    char real[PATH_MAX];
    ASSERT_NE(realpath(info.dli_fname, real), nullptr);
    ASSERT_EQ(mount("/dev/null", real, nullptr, MS_BIND, nullptr), 0);
    auto missing = Hadro("network firewall get");
    auto refused = Hadro("network firewall ruleset list");
    // The other areas do not need it.
    auto ipsec = Hadro("network ip ipsec sp list");
    umount2(real, MNT_DETACH);
    EXPECT_EQ(missing.status, 1);
    EXPECT_EQ(
        missing.err.rfind("Unable to get firewall status.\nThe firewall is not available on this Linux host: "
                          "cannot load libnftables.so.1 (",
                          0),
        0u)
        << missing.err;
    EXPECT_EQ(refused.status, 1);
    EXPECT_EQ(ipsec.status, 0) << ipsec.All();
}

TEST_F(FirewallTest, ADamagedDocumentIsRefusedAndKept) {
    const std::string damaged = R"({"version": 1, "firewall": {"defaultAction": "MAYBE"}})";
    std::ofstream(document_) << damaged;
    auto result = Hadro("network firewall get");
    EXPECT_EQ(result.status, 3);
    EXPECT_NE(result.err.find("Linux host document " + document_ +
                              ": firewall: \"defaultAction\" is not PASS or DROP\n"),
              std::string::npos)
        << result.err;
    EXPECT_EQ(Slurp(document_), damaged);
}

}  // namespace

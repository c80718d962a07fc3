// The firewall's nftables table as commands and as listings, without a kernel.
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include "hostctl/exception.h"
#include "kernel/nftables.h"

namespace {

namespace K = TknCtl::Linux::Kernel;
using nlohmann::json;

constexpr std::uint32_t kDst = 1, kSrc = 0, kIn = 0, kOut = 1, kTcp = 0, kUdp = 1;

K::NftFirewall Sample() {
    K::NftFirewall firewall;
    firewall.enabled = true;
    firewall.pass = false;
    firewall.rulesets.push_back({"sshServer", {{kDst, 22, 22, kIn, kTcp}}, true, {}});
    firewall.rulesets.push_back({"webAccess",
                                 {{kDst, 443, 443, kIn, kTcp}, {kDst, 8000, 8010, kOut, kUdp}},
                                 false,
                                 {"192.0.2.7", "198.51.100.0/24", "2001:db8::/64"}});
    firewall.dynamicRules.push_back({kSrc, 4500, 4500, kOut, kUdp});
    return firewall;
}

// What nft lists for a table built by these commands: the objects of the "add" commands, in
// their order, with handles.
std::string ListingOf(const std::string& commands) {
    json listing = json::array({json{{"metainfo", {{"json_schema_version", 1}}}}});
    int handle = 1;
    bool table = false;
    const json parsed = json::parse(commands);
    for (const auto& command : parsed["nftables"]) {
        if (!command.contains("add")) continue;
        json object = command["add"];
        if (object.contains("table")) {
            if (table) continue;
            table = true;
        }
        object.begin().value()["handle"] = handle++;
        listing.push_back(object);
    }
    return json{{"nftables", listing}}.dump();
}

std::vector<json> Rules(const json& commands, const std::string& chain) {
    std::vector<json> out;
    for (const auto& command : commands["nftables"]) {
        if (command.contains("add") && command["add"].contains("rule") &&
            command["add"]["rule"]["chain"] == chain)
            out.push_back(command["add"]["rule"]);
    }
    return out;
}

TEST(NftTable, TheWholeTableIsReplacedInOneBatchAndTheInputChainCarriesTheSwitches) {
    json commands = json::parse(K::BuildFirewall(Sample()));
    const auto& list = commands["nftables"];
    // Made, deleted and made again: replaced whether it was there or not, nothing else touched.
    EXPECT_EQ(list[0], json::parse(R"({"add":{"table":{"family":"inet","name":"hadro"}}})"));
    EXPECT_EQ(list[1], json::parse(R"({"delete":{"table":{"family":"inet","name":"hadro"}}})"));
    for (const auto& command : list) {
        const json& object = command.begin().value().begin().value();
        EXPECT_EQ(object["family"], "inet");
        EXPECT_EQ(object.contains("table") ? object["table"] : object["name"], "hadro");
    }
    EXPECT_EQ(list[3]["add"]["chain"]["policy"], "drop");
    EXPECT_EQ(list[3]["add"]["chain"]["hook"], "input");
    auto input = Rules(commands, "input");
    ASSERT_EQ(input.size(), 6u);  // loopback, replies, ICMPv6, two rulesets, dynamic rules
    EXPECT_EQ(input[3]["expr"][0]["jump"]["target"], "sshServer");
    EXPECT_EQ(input[4]["expr"][0]["jump"]["target"], "webAccess");
    EXPECT_EQ(input[5]["expr"][0]["jump"]["target"], "runtime");

    // Disabled: the chains and sets stay, the input chain accepts everything.
    K::NftFirewall disabled = Sample();
    disabled.enabled = false;
    json off = json::parse(K::BuildFirewall(disabled));
    EXPECT_EQ(off["nftables"][3]["add"]["chain"]["policy"], "accept");
    EXPECT_TRUE(Rules(off, "input").empty());
    EXPECT_EQ(Rules(off, "webAccess").size(), 4u);
}

TEST(NftTable, RulesMatchPortsByDirectionAndAllowedAddressesThroughSets) {
    json commands = json::parse(K::BuildFirewall(Sample()));
    auto ssh = Rules(commands, "sshServer");
    ASSERT_EQ(ssh.size(), 1u);  // all addresses allowed: no address match
    EXPECT_EQ(ssh[0]["comment"], "inbound");
    EXPECT_EQ(ssh[0]["expr"][0]["match"]["left"]["payload"],
              json::parse(R"({"protocol":"tcp","field":"dport"})"));
    EXPECT_EQ(ssh[0]["expr"][0]["match"]["right"], 22);

    auto web = Rules(commands, "webAccess");
    ASSERT_EQ(web.size(), 4u);  // each rule for the IPv4 and the IPv6 set
    EXPECT_EQ(web[0]["expr"][0]["match"]["right"], "@webAccess_v4");
    EXPECT_EQ(web[1]["expr"][0]["match"]["left"]["payload"]["protocol"], "ip6");
    EXPECT_EQ(web[1]["expr"][0]["match"]["right"], "@webAccess_v6");
    // Outbound to destination ports 8000-8010: their replies come from those ports.
    EXPECT_EQ(web[2]["comment"], "outbound");
    EXPECT_EQ(web[2]["expr"][1]["match"]["left"]["payload"],
              json::parse(R"({"protocol":"udp","field":"sport"})"));
    EXPECT_EQ(web[2]["expr"][1]["match"]["right"], json::parse(R"({"range":[8000,8010]})"));
    // Outbound from source port 4500: the replies go to it.
    auto dynamic = Rules(commands, "runtime");
    ASSERT_EQ(dynamic.size(), 1u);
    EXPECT_EQ(dynamic[0]["expr"][0]["match"]["left"]["payload"]["field"], "dport");

    for (const auto& command : commands["nftables"]) {
        if (!command.contains("add") || !command["add"].contains("set")) continue;
        const json& set = command["add"]["set"];
        if (set["name"] == "webAccess_v4") {
            EXPECT_EQ(set["elem"],
                      json::parse(R"(["192.0.2.7",{"prefix":{"addr":"198.51.100.0","len":24}}])"));
        }
        if (set["name"] == "sshServer_v6") {
            EXPECT_FALSE(set.contains("elem"));
        }
    }
}

TEST(NftTable, AListingReadsBackAsWhatWasWritten) {
    for (bool enabled : {true, false}) {
        K::NftFirewall firewall = Sample();
        firewall.enabled = enabled;
        auto parsed = K::ParseFirewall(ListingOf(K::BuildFirewall(firewall)));
        EXPECT_EQ(K::Difference(firewall, parsed), "") << enabled;
        EXPECT_EQ(parsed.rulesets[1].rules.size(), 2u);
        EXPECT_FALSE(parsed.rulesets[1].allowedAll);
        EXPECT_TRUE(parsed.rulesets[0].allowedAll);
    }
    K::NftFirewall empty;
    empty.enabled = true;
    empty.pass = true;
    EXPECT_EQ(K::Difference(empty, K::ParseFirewall(ListingOf(K::BuildFirewall(empty)))), "");
}

TEST(NftTable, WhatTheFirewallDidNotMakeIsLeftOutAndNamed) {
    // As nft lists a table that someone changed by hand.
    const std::string listing = R"({"nftables":[
      {"metainfo":{"version":"1.0.6","json_schema_version":1}},
      {"table":{"family":"inet","name":"hadro","handle":2}},
      {"set":{"family":"inet","name":"sshServer_v4","table":"hadro","type":"ipv4_addr","flags":["interval"],
              "elem":["10.0.0.1",{"range":["10.0.0.4","10.0.0.9"]},{"prefix":{"addr":"10.1.0.0","len":16}}]}},
      {"chain":{"family":"inet","table":"hadro","name":"input","handle":1,"type":"filter","hook":"input",
                "prio":0,"policy":"accept"}},
      {"chain":{"family":"inet","table":"hadro","name":"output","handle":3,"type":"filter","hook":"output",
                "prio":0,"policy":"drop"}},
      {"chain":{"family":"inet","table":"hadro","name":"sshServer","handle":4}},
      {"rule":{"family":"inet","table":"hadro","chain":"input","handle":5,"expr":[{"jump":{"target":"sshServer"}}]}},
      {"rule":{"family":"inet","table":"hadro","chain":"sshServer","handle":6,"comment":"inbound",
               "expr":[{"match":{"op":"==","left":{"payload":{"protocol":"ip","field":"saddr"}},"right":"@sshServer_v4"}},
                       {"match":{"op":"==","left":{"payload":{"protocol":"tcp","field":"dport"}},"right":22}},
                       {"accept":null}]}},
      {"rule":{"family":"inet","table":"hadro","chain":"sshServer","handle":7,
               "expr":[{"match":{"op":"==","left":{"payload":{"protocol":"tcp","field":"dport"}},"right":23}},
                       {"accept":null}]}},
      {"rule":{"family":"inet","table":"hadro","chain":"sshServer","handle":8,"comment":"inbound",
               "expr":[{"counter":{"packets":0,"bytes":0}},{"accept":null}]}}]})";
    std::vector<std::string> unknown;
    auto firewall = K::ParseFirewall(listing, &unknown);
    EXPECT_TRUE(firewall.enabled);
    EXPECT_TRUE(firewall.pass);
    ASSERT_EQ(firewall.rulesets.size(), 1u);
    const auto& ssh = firewall.rulesets[0];
    EXPECT_EQ(ssh.rules, (std::vector<K::NftRule>{{kDst, 22, 22, kIn, kTcp}}));
    EXPECT_FALSE(ssh.allowedAll);
    // A range is the networks that cover it exactly.
    EXPECT_EQ(ssh.allowed,
              (std::vector<std::string>{"10.0.0.1", "10.0.0.4/30", "10.0.0.8/31", "10.1.0.0/16"}));
    ASSERT_EQ(unknown.size(), 3u);
    EXPECT_NE(unknown[0].find("chain output"), std::string::npos);
    EXPECT_NE(unknown[1].find("handle 7"), std::string::npos);
    EXPECT_NE(unknown[2].find("handle 8"), std::string::npos);

    EXPECT_THROW(K::ParseFirewall("not json"), HostCtl::Lib::HostCtlException);
    EXPECT_THROW(K::ParseFirewall(R"({"other":[]})"), HostCtl::Lib::HostCtlException);
}

TEST(NftTable, DifferencesAreNamed) {
    K::NftFirewall asked = Sample();
    K::NftFirewall held = Sample();
    std::reverse(held.rulesets[1].allowed.begin(), held.rulesets[1].allowed.end());
    EXPECT_EQ(K::Difference(asked, held), "");  // the kernel keeps its own order
    held.pass = true;
    EXPECT_EQ(K::Difference(asked, held), "the input chain's policy is not drop");
    held = Sample();
    held.rulesets[1].allowed.pop_back();
    EXPECT_EQ(K::Difference(asked, held), "the allowed addresses of ruleset webAccess differ");
    held = Sample();
    held.rulesets.pop_back();
    EXPECT_EQ(K::Difference(asked, held), "the enabled rulesets differ");
    held = Sample();
    held.rulesets[0].allowedAll = false;
    EXPECT_EQ(K::Difference(asked, held), "ruleset sshServer matches addresses though all are allowed");
    held = Sample();
    held.enabled = false;
    EXPECT_EQ(K::Difference(asked, held), "the input chain does not filter");
}

TEST(NftAllowed, CanonicalTextAndOverlaps) {
    EXPECT_EQ(K::CanonicalAllowed("192.0.2.9"), "192.0.2.9");
    EXPECT_EQ(K::CanonicalAllowed("192.0.2.9/24"), "192.0.2.0/24");
    EXPECT_EQ(K::CanonicalAllowed("192.0.2.9/32"), "192.0.2.9");
    EXPECT_EQ(K::CanonicalAllowed("2001:DB8:0::1/128"), "2001:db8::1");
    EXPECT_EQ(K::CanonicalAllowed("2001:db8::1/48"), "2001:db8::/48");
    EXPECT_EQ(K::CanonicalAllowed("0.0.0.0/0"), "0.0.0.0/0");
    for (const char* bad : {"", "host.example", "192.0.2.1/33", "192.0.2.1/", "192.0.2.1/2x", "::/129",
                            "1.2.3/8", "192.0.2.1/-1", "192.0.2.1-192.0.2.9"})
        EXPECT_FALSE(K::CanonicalAllowed(bad)) << bad;

    EXPECT_TRUE(K::Overlaps("192.0.2.0/24", "192.0.2.200"));
    EXPECT_TRUE(K::Overlaps("192.0.2.128/25", "192.0.2.0/24"));
    EXPECT_TRUE(K::Overlaps("2001:db8::1", "2001:db8::1"));
    EXPECT_FALSE(K::Overlaps("192.0.2.0/25", "192.0.2.128/25"));
    EXPECT_FALSE(K::Overlaps("0.0.0.0/0", "::/0"));
}

TEST(Nftables, AMissingLibraryIsRefusedSayingWhatIsMissing) {
    try {
        K::Nftables library("libnftables-not-here.so.1");
        FAIL() << "loaded";
    } catch (const HostCtl::Lib::HostCtlException& e) {
        std::string message = e.what();
        EXPECT_EQ(message.rfind("The firewall is not available on this Linux host: cannot load "
                                "libnftables-not-here.so.1 (",
                                0),
                  0u)
            << message;
        EXPECT_NE(message.find("libnftables1"), std::string::npos) << message;
    }
}

}  // namespace

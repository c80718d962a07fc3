// IPsec of the Linux host: xfrm policies (this kernel has them) agree with `ip xfrm policy`;
// xfrm states are refused (this kernel has no ESP) with a message naming what is missing.
#include <fstream>
#include <sstream>

#include "namespace_host.h"

namespace {

using Hadro::Test::Has;
using Hadro::Test::Slurp;

using nlohmann::json;

// A policy as `ip xfrm policy` prints it (it has no JSON output for xfrm).
struct Printed {
    std::string src, dst, proto, sport, dport, dir, action = "allow", mode, spi;
};

std::string After(const std::string& line, const std::string& word) {
    std::istringstream in(line);
    for (std::string w; in >> w;) {
        if (w == word && in >> w) return w;
    }
    return {};
}

std::vector<Printed> ParsePolicies(const std::string& text) {
    std::vector<Printed> out;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) {
        if (line.rfind("src ", 0) == 0) {
            Printed policy;
            policy.src = After(line, "src");
            policy.dst = After(line, "dst");
            policy.proto = After(line, "proto");
            policy.sport = After(line, "sport");
            policy.dport = After(line, "dport");
            out.push_back(policy);
        } else if (!out.empty() && line.find("dir ") != std::string::npos &&
                   line.find("tmpl") == std::string::npos) {
            out.back().dir = After(line, "dir");
            if (!After(line, "action").empty()) out.back().action = After(line, "action");
        } else if (!out.empty() && line.find("proto esp") != std::string::npos) {
            out.back().mode = After(line, "mode");
            out.back().spi = After(line, "spi");
        }
    }
    return out;
}

class IpsecTest : public Hadro::Test::NamespaceHostTest {
protected:
    const Printed* Find(const std::vector<Printed>& policies, const std::string& src,
                        const std::string& dir) {
        for (const auto& p : policies) {
            if (p.src == src && p.dir == dir) return &p;
        }
        return nullptr;
    }
};

TEST_F(IpsecTest, PoliciesAreXfrmPoliciesNamedByTheDocument) {
    ASSERT_EQ(
        Hadro(
            "network ip ipsec sp add -n ssh-in -s 2001:db8::/64 -d 2001:db8:1::5/128 -p 0 -P 22 -u tcp -w in "
            "-A ipsec -m tunnel")
            .status,
        0);
    ASSERT_EQ(
        Hadro("network ip ipsec sp add -n drop-all -s any -d any -p 0 -P 0 -A discard -m tunnel").status, 0);
    ASSERT_EQ(Hadro("network ip ipsec sp add -n dns-bypass -s 2001:db8::/48 -d any -p 53 -P 0 -u udp -A none")
                  .status,
              0);

    auto kernel = ParsePolicies(Sh("ip xfrm policy"));
    ASSERT_EQ(kernel.size(), 3u);
    const auto* ssh = Find(kernel, "2001:db8::/64", "in");
    ASSERT_TRUE(ssh);
    EXPECT_EQ(ssh->dst, "2001:db8:1::5/128");
    EXPECT_EQ(ssh->proto, "tcp");
    EXPECT_EQ(ssh->dport, "22");
    EXPECT_EQ(ssh->mode, "tunnel");
    const auto* drop = Find(kernel, "::/0", "out");
    ASSERT_TRUE(drop);
    EXPECT_EQ(drop->action, "block");
    EXPECT_EQ(drop->mode, "");  // a discarding policy asks for no state
    const auto* dns = Find(kernel, "2001:db8::/48", "out");
    ASSERT_TRUE(dns);
    EXPECT_EQ(dns->sport, "53");
    EXPECT_EQ(dns->action, "allow");
    EXPECT_EQ(dns->mode, "");

    // Listed as they were added, with the names of the document.
    auto listed = HadroJson("network ip ipsec sp list");
    ASSERT_EQ(listed.size(), 3u);
    EXPECT_EQ(listed[0], json::parse(R"({"Name":"ssh-in","Source Address":"2001:db8::/64","Source Port":0,
        "Destination Address":"2001:db8:1::5/128","Destination Port":22,"Protocol":"tcp","Flow":"in",
        "Action":"ipsec","Mode":"tunnel","SA Name":""})"));
    EXPECT_EQ(listed[1]["Name"], "drop-all");
    EXPECT_EQ(listed[1]["Action"], "discard");
    EXPECT_EQ(listed[1]["Mode"], "transport");  // the mode of a policy that does not protect
    EXPECT_EQ(listed[2]["Name"], "dns-bypass");
    EXPECT_EQ(listed[2]["Action"], "none");
    EXPECT_EQ(listed[2]["Source Port"], 53);

    ASSERT_EQ(Hadro("network ip ipsec sp remove -n drop-all").status, 0);
    kernel = ParsePolicies(Sh("ip xfrm policy"));
    EXPECT_EQ(kernel.size(), 2u);
    EXPECT_FALSE(Find(kernel, "::/0", "out"));
    EXPECT_EQ(Slurp(document_).find("drop-all"), std::string::npos);
    ASSERT_EQ(Hadro("network ip ipsec sp remove -a").status, 0);
    EXPECT_EQ(Sh("ip xfrm policy"), "");
    EXPECT_EQ(HadroJson("network ip ipsec sp list"), json::array());
}

TEST_F(IpsecTest, PoliciesOfOtherToolsAreShownByIndexOrLeftOutWithAWarning) {
    Sh("ip xfrm policy add src 2001:db8:9::/64 dst ::/0 dir out action block");
    Sh("ip xfrm policy add src 10.0.0.0/8 dst 10.1.0.0/16 dir out action block");
    Sh("ip xfrm policy add src 2001:db8:7::/64 dst ::/0 dir fwd action block");
    // A policy that asks for a state that is not there: its SA is unknown.
    Sh("ip xfrm policy add src 2001:db8:8::/64 dst ::/0 dir in tmpl src 2001:db8::1 dst 2001:db8::2 proto "
       "esp "
       "spi 0x1000 mode transport");
    auto listed = Hadro("--formatter=json network ip ipsec sp list");
    EXPECT_EQ(listed.status, 1);  // the listing comes with the message about unknown SAs
    auto policies = json::parse(listed.out);
    ASSERT_EQ(policies.size(), 2u);
    std::string unnamed = policies[0]["Name"];
    EXPECT_EQ(unnamed.rfind("xfrm-", 0), 0u) << unnamed;
    EXPECT_EQ(policies[1]["SA Name"], "UNKNOWN*");
    EXPECT_NE(listed.err.find("Warning: 2 IPsec policies of the kernel are not shown"), std::string::npos)
        << listed.err;
    EXPECT_NE(listed.err.find("*Some SPs with unique but deleted SAs were found."), std::string::npos)
        << listed.err;

    // Such a name is the kernel's, not one to give.
    auto reserved = Hadro("network ip ipsec sp add -n xfrm-99999 -s 2001:db8:5::/64 -d any -p 0 -P 0");
    EXPECT_EQ(reserved.status, 1);
    EXPECT_NE(reserved.err.find("names starting with 'xfrm-' are kept"), std::string::npos) << reserved.err;
    // The same selector and direction is one policy: refused, naming the one there.
    auto same = Hadro("network ip ipsec sp add -n again -s 2001:db8:9::/64 -d any -p 0 -P 0 -w out");
    EXPECT_EQ(same.status, 1);
    EXPECT_EQ(same.err, "Cannot add Security Policy 'again': Security Policy '" + unnamed +
                            "' already covers the same addresses, ports, protocol and direction\n");
    auto noSa = Hadro("network ip ipsec sp add -n p -a nosuch -s any -d any -p 0 -P 0");
    EXPECT_EQ(noSa.err, "Security Association 'nosuch' does not exist\n");

    ASSERT_EQ(Hadro("network ip ipsec sp remove -n " + unnamed).status, 0);
    // Removing all leaves what the commands do not show.
    ASSERT_EQ(Hadro("network ip ipsec sp remove -a").status, 0);
    auto left = ParsePolicies(Sh("ip xfrm policy"));
    ASSERT_EQ(left.size(), 2u);
    EXPECT_TRUE(Find(left, "10.0.0.0/8", "out"));
    EXPECT_TRUE(Find(left, "2001:db8:7::/64", "fwd"));
    auto unknown = Hadro("network ip ipsec sp remove -n gone");
    EXPECT_EQ(unknown.status, 1);
    EXPECT_EQ(unknown.err, "Security Policy 'gone' does not exist\n");
}

TEST_F(IpsecTest, AssociationsNeedEspWhichThisKernelLacks) {
    auto refused = Hadro(
        "network ip ipsec sa add -n sa1 -s 2001:db8::1 -d 2001:db8::2 -p 0x1000 -e aes128-cbc "
        "-k 0x00112233445566778899aabbccddeeff -i hmac-sha1 -K 0123456789abcdefghij");
    EXPECT_EQ(refused.status, 1);
    EXPECT_EQ(refused.err.rfind(
                  "Cannot add Security Association 'sa1': the kernel of this Linux host has no ESP for "
                  "IPv6 (module esp6, CONFIG_INET6_ESP): IPsec security associations are not "
                  "available",
                  0),
              0u)
        << refused.err;
    EXPECT_EQ(Sh("ip xfrm state"), "");
    // Nothing stored as if done, and no key anywhere.
    EXPECT_EQ(Slurp(document_).find("sa1"), std::string::npos);
    EXPECT_EQ(HadroJson("network ip ipsec sa list"), json::array());

    // A key the kernel could not take is refused before it is asked.
    auto shortKey = Hadro(
        "network ip ipsec sa add -n sa2 -s any -d 2001:db8::2 -p 0x1000 -e aes128-cbc -k short "
        "-i hmac-sha1 -K 0123456789abcdefghij");
    EXPECT_EQ(
        shortKey.err,
        "The encryption key for aes128-cbc must be 16 bytes (128 bits) on a Linux host: 16 ASCII characters "
        "or 0x and 32 hexadecimal digits, not 5 bytes\n");
    EXPECT_EQ(Hadro("network ip ipsec sa remove -n sa1").err, "Security Association 'sa1' does not exist\n");
    EXPECT_EQ(
        Hadro("network ip ipsec sa remove -n auto -s 2001:db8::1 -d 2001:db8::2 -p 0x1000").err,
        "No automatic Security Association has source 2001:db8::1, destination 2001:db8::2 and SPI 0x1000\n");
    EXPECT_EQ(Hadro("network ip ipsec sa remove -a").status, 0);
}

TEST_F(IpsecTest, IpsecNeedsRootAndADamagedDocumentIsRefused) {
    ASSERT_EQ(Hadro("network ip ipsec sp add -n p1 -s any -d any -p 0 -P 0 -A discard").status, 0);
    // The kernel shows IPsec only to root: a read says so, a change says what it needs.
    EXPECT_EQ(
        HadroUnprivileged("network ip ipsec sp list").err,
        "Cannot read the kernel's IPsec policies: the kernel shows them only to root (CAP_NET_ADMIN)\n");
    EXPECT_EQ(HadroUnprivileged("network ip ipsec sa list").err,
              "Cannot read the kernel's IPsec states: the kernel shows them only to root (CAP_NET_ADMIN)\n");
    for (const char* command :
         {"network ip ipsec sp remove -n p1", "network ip ipsec sp add -n p2 -s any -d any -p 0 -P 1",
          "network ip ipsec sp remove -a", "network ip ipsec sa remove -n sa1",
          "network ip ipsec sa add -n sa1 -s any -d 2001:db8::2 -p 0x1000 -e null -i hmac-sha1 -K "
          "0123456789abcdefghij"}) {
        auto refused = HadroUnprivileged(command);
        EXPECT_EQ(refused.status, 1) << command;
        EXPECT_EQ(refused.err, "Changing the host's network needs root (CAP_NET_ADMIN)\n") << command;
    }
    EXPECT_EQ(ParsePolicies(Sh("ip xfrm policy")).size(), 1u);

    std::ofstream(document_) << R"({"version": 1, "ipsec": {"sps": [{"name": 7}]}})";
    auto damaged = Hadro("network ip ipsec sp list");
    EXPECT_EQ(damaged.status, 3);
    EXPECT_NE(damaged.err.find("Linux host document " + document_ +
                               ": ipsec: sps: an entry has no text \"name\"\n"),
              std::string::npos)
        << damaged.err;
}

}  // namespace

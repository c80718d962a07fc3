// "network ip ipsec sa|sp ...": security associations and policies.
#include <nlohmann/json.hpp>

#include "harness.h"

namespace {

using Hadro::Test::CommandTest;
using Strings = std::vector<std::string>;

const std::string kAesKey = "0x00112233445566778899aabbccddeeff";           // 128 bits
const std::string kSha1Key = "0x0123456789abcdef0123456789abcdef01234567";  // 160 bits

const char* const kRemoveSaMessage[] = {
    "Can not figure out which operation you want to perform.",
    "Remove a unique SA: Only specify the '--sa-name' option to remove a normal SA.",
    "Remove an auto SA: Set the '--sa-name' to 'auto'. You should also specify '--sa-source', "
    "'--sa-destination' "
    "and '--sa-spi' and omit '--remove-all' when removing an auto SA.",
    "Remove all SAs: You should only set the flag '--remove-all' to remove all SAs."};

class IpsecTest : public CommandTest {
protected:
    // "sa add" with the given name, SPI and further options; a null algorithm and an ASCII
    // integrity key unless the options say otherwise.
    Hadro::Test::Result AddSa(const std::string& name, const std::string& spi, Strings more = {}) {
        Strings args{"network",
                     "ip",
                     "ipsec",
                     "sa",
                     "add",
                     "--sa-name",
                     name,
                     "--sa-source",
                     "2001:db8::1",
                     "--sa-destination",
                     "2001:db8::2",
                     "--sa-spi",
                     spi};
        bool encryption = false, integrity = false;
        for (const auto& a : more) {
            encryption = encryption || a == "-e" || a == "--encryption-algorithm";
            integrity = integrity || a == "-i" || a == "--integrity-algorithm";
        }
        if (!encryption) more.insert(more.end(), {"-e", "null"});
        if (!integrity) more.insert(more.end(), {"-i", "hmac-sha1", "-K", "secret"});
        args.insert(args.end(), more.begin(), more.end());
        return Run(args);
    }
    nlohmann::json Sas() { return Section("ipsec")["sas"]; }
    nlohmann::json Sps() { return Section("ipsec")["sps"]; }
    nlohmann::json Json(const std::string& line) { return nlohmann::json::parse(Run(line).out); }

    // A host with SAs of four lifetimes, an automatic SA and policies that use them.
    void UseFixture() {
        EditHost([](nlohmann::json& doc) {
            auto sa = [](const char* name, std::uint32_t spi, int lifetime, bool automatic = false) {
                return nlohmann::json{{"name", name},
                                      {"source", "fe80::1"},
                                      {"destination", "fe80::2"},
                                      {"spi", spi},
                                      {"lifetime", lifetime},
                                      {"automatic", automatic},
                                      {"state", "mature"},
                                      {"mode", "tunnel"},
                                      {"encryptionAlgorithm", "aes128-cbc"},
                                      {"encryptionKey", "k"},
                                      {"integrityAlgorithm", "hmac-sha2-256"},
                                      {"integrityKey", "k"}};
            };
            doc["ipsec"]["sas"] = {sa("forever", 0x1000, 0), sa("minute", 0x1001, 60),
                                   sa("hour", 0x1002, 3600), sa("mixed", 0xabcdef12, 3725),
                                   sa("auto", 0x2000, 30, true)};
            doc["ipsec"]["sps"] = {{{"name", "web"},
                                    {"saName", "hour"},
                                    {"source", "2001:db8::/32"},
                                    {"sourcePort", 0},
                                    {"destination", "::/0"},
                                    {"destinationPort", 443},
                                    {"protocol", "tcp"},
                                    {"direction", "in"},
                                    {"action", "ipsec"},
                                    {"mode", "tunnel"}},
                                   {{"name", "any"},
                                    {"saName", ""},
                                    {"source", "::/0"},
                                    {"sourcePort", 0},
                                    {"destination", "::/0"},
                                    {"destinationPort", 0},
                                    {"protocol", "any"},
                                    {"direction", "out"},
                                    {"action", "discard"},
                                    {"mode", "transport"}}};
        });
    }
};

TEST_F(IpsecTest, SaAddStoresTheAssociation) {
    auto r = AddSa("sa1", "1f00",
                   {"-m", "tunnel", "-e", "aes128-cbc", "-k", kAesKey, "-i", "hmac-sha1", "-K", kSha1Key});
    EXPECT_EQ(r.status, 0) << r.err;
    auto sa = Sas()[0];
    EXPECT_EQ(sa["name"], "sa1");
    EXPECT_EQ(sa["source"], "2001:db8::1");
    EXPECT_EQ(sa["spi"], 0x1f00);
    EXPECT_EQ(sa["mode"], "tunnel");
    EXPECT_EQ(sa["encryptionAlgorithm"], "aes128-cbc");
    EXPECT_EQ(sa["encryptionKey"], kAesKey);
    EXPECT_EQ(sa["integrityKey"], kSha1Key);

    // "any" is the unspecified address; the mode defaults to transport.
    r = Run("network ip ipsec sa add -n sa2 -s any -d any -p 0x200 -e null -i hmac-sha2-256 -K text");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(Sas()[1]["source"], "::");
    EXPECT_EQ(Sas()[1]["destination"], "::");
    EXPECT_EQ(Sas()[1]["mode"], "transport");

    // Listing never shows keys.
    auto list = Run("network ip ipsec sa list");
    EXPECT_EQ(list.status, 0);
    EXPECT_EQ(list.out.find("0x0011"), std::string::npos);
    EXPECT_EQ(list.out,
              "Name  Source Address  Destination Address  State   SPI     Mode       Encryption Algorithm  "
              "Integrity Algorithm  Lifetime\n"
              "----  --------------  -------------------  ------  ------  ---------  --------------------  "
              "-------------------  --------\n"
              "sa1   2001:db8::1     2001:db8::2          mature  0x1f00  tunnel     aes128-cbc            "
              "hmac-sha1            infinite\n"
              "sa2   ::              ::                   mature  0x200   transport  null                  "
              "hmac-sha2-256        infinite\n");
}

TEST_F(IpsecTest, SaAddReadsTheSpiAsHex) {
    struct Case {
        const char* text;
        long long spi;  // -1: refused
    };
    const Case cases[] = {
        {"1f00", 0x1f00}, {"0x1F01", 0x1f01}, {"0XABCDEF", 0xabcdef}, {"ffffffff", 0xffffffff},
        {"12g4", -1},     {"0x", -1},         {"0x100z", -1},         {"100 ", -1},
        {" 100", -1},     {"-100", -1},       {"+100", -1},           {"100000000", -1},
        {"", -1}};
    int added = 0;
    for (const auto& c : cases) {
        auto r = AddSa("sa" + std::to_string(added), c.text);
        if (c.spi < 0) {
            EXPECT_EQ(r.status, 1) << c.text;
            EXPECT_EQ(r.Errors(),
                      Strings{"Check the input value for '--sa-spi'. Should be hex integer. Got " +
                              std::string(c.text)})
                << c.text;
        } else {
            EXPECT_EQ(r.status, 0) << c.text << r.err;
            EXPECT_EQ(Sas()[added]["spi"], c.spi) << c.text;
            ++added;
        }
    }
    EXPECT_EQ(Sas().size(), static_cast<std::size_t>(added));
}

TEST_F(IpsecTest, SaAddChecksKeysAndUniqueness) {
    EXPECT_EQ(AddSa("plain", "300").status, 0);
    EXPECT_EQ(AddSa("aes", "301", {"-e", "aes128-cbc"}).Errors(), Strings{"Missing encryption key"});
    EXPECT_EQ(
        AddSa("aes", "301", {"-e", "aes128-cbc", "-k", "0x0011"}).Errors(),
        Strings{
            "Invalid hex encryption key for aes128-cbc: it needs 32 hexadecimal digits (128 bits), not 4"});
    EXPECT_EQ(
        AddSa("des", "301", {"-e", "3des-cbc", "-k", kAesKey}).Errors(),
        Strings{
            "Invalid hex encryption key for 3des-cbc: it needs 48 hexadecimal digits (192 bits), not 32"});
    EXPECT_EQ(
        AddSa("sha", "301", {"-i", "hmac-sha2-256", "-K", kSha1Key}).Errors(),
        Strings{"Invalid hex integrity key for hmac-sha2-256: it needs 64 hexadecimal digits (256 bits), not "
                "40"});
    EXPECT_EQ(AddSa("nul", "301", {"-e", "null", "-k", "abc"}).Errors(),
              Strings{"The null encryption algorithm takes no encryption key"});
    EXPECT_EQ(AddSa("plain", "302").Errors(), Strings{"Security Association 'plain' already exists"});
    EXPECT_EQ(
        AddSa("other", "300").Errors(),
        Strings{"Security Association 'plain' already has source 2001:db8::1, destination 2001:db8::2 and "
                "SPI 0x300"});
    EXPECT_EQ(AddSa("auto", "303").Errors(), Strings{"The Security Association name 'auto' is reserved"});
    EXPECT_EQ(AddSa("low", "ff").Errors(),
              Strings{"SPI 0xff is reserved: an SPI is from 0x100 to 0xffffffff"});
    EXPECT_EQ(
        Run("network ip ipsec sa add -n bad -s 2001:db8::zz -d any -p 400 -e null -i hmac-sha1 -K k").status,
        1);
    EXPECT_EQ(Sas().size(), 1u);
}

TEST_F(IpsecTest, SaListRendersLifetimesAndSpis) {
    UseFixture();
    auto list = Json("--formatter=json network ip ipsec sa list");
    ASSERT_EQ(list.size(), 5u);
    EXPECT_EQ(list[0]["Lifetime"], "infinite");
    EXPECT_EQ(list[1]["Lifetime"], "1m ");
    EXPECT_EQ(list[2]["Lifetime"], "1h ");
    EXPECT_EQ(list[3]["Lifetime"], "1h 2m 5s ");
    EXPECT_EQ(list[4]["Lifetime"], "30s ");
    EXPECT_EQ(list[3]["SPI"], "0xabcdef12");
    EXPECT_EQ(list[3], nlohmann::json::parse(R"({"Name":"mixed","Source Address":"fe80::1",
        "Destination Address":"fe80::2","State":"mature","SPI":"0xabcdef12","Mode":"tunnel",
        "Encryption Algorithm":"aes128-cbc","Integrity Algorithm":"hmac-sha2-256","Lifetime":"1h 2m 5s "})"));
}

TEST_F(IpsecTest, SaRemoveKnowsThreeCases) {
    UseFixture();
    // A unique SA: its policies are left naming "UNKNOWN".
    EXPECT_EQ(Run("network ip ipsec sa remove --sa-name hour").status, 0);
    EXPECT_EQ(Sas().size(), 4u);
    EXPECT_EQ(Sps()[0]["saName"], "UNKNOWN");
    EXPECT_EQ(Run("network ip ipsec sa remove -n hour").Errors(),
              Strings{"Security Association 'hour' does not exist"});

    // The automatic SA, by source, destination and SPI; the SPI is checked as "sa add" does.
    auto bad = Run("network ip ipsec sa remove -n auto -s fe80::1 -d fe80::2 -p 20x0");
    EXPECT_EQ(bad.Errors(), Strings{"Check the input value for '--sa-spi'. Should be hex integer. Got 20x0"});
    EXPECT_EQ(
        Run("network ip ipsec sa remove -n auto -s fe80::1 -d fe80::2 -p 0x1000").Errors(),
        Strings{"No automatic Security Association has source fe80::1, destination fe80::2 and SPI 0x1000"});
    StartJournal();
    EXPECT_EQ(Run("network ip ipsec sa remove -n auto -s fe80::1 -d fe80::2 -p 2000").status, 0);
    EXPECT_EQ(Journal("TknCtl::Network::IpSecConfigImpl::Remove"),
              Strings{"TknCtl::Network::IpSecConfigImpl::RemoveAutoSADConfig fe80::1 fe80::2 0x2000"});
    EXPECT_EQ(Sas().size(), 3u);

    // Everything.
    EXPECT_EQ(Run("network ip ipsec sa remove --remove-all").status, 0);
    EXPECT_TRUE(Sas().empty());
    EXPECT_EQ(Sps()[0]["saName"], "UNKNOWN");
    EXPECT_EQ(Sps()[1]["saName"], "");
}

TEST_F(IpsecTest, SaRemoveRefusesOtherCombinations) {
    UseFixture();
    const Strings message(std::begin(kRemoveSaMessage), std::end(kRemoveSaMessage));
    for (const char* line :
         {"network ip ipsec sa remove", "network ip ipsec sa remove -n auto -s fe80::1 -d fe80::2",
          "network ip ipsec sa remove -a -n hour", "network ip ipsec sa remove -n hour -p 1002",
          "network ip ipsec sa remove -n auto -s fe80::1 -d fe80::2 -p 2000 -a",
          "network ip ipsec sa remove -a -s fe80::1"}) {
        auto r = Run(line);
        EXPECT_EQ(r.status, 1) << line;
        EXPECT_EQ(r.out, "") << line;
        EXPECT_EQ(r.Errors(), message) << line;
    }
    EXPECT_EQ(Sas().size(), 5u);
}

TEST_F(IpsecTest, SpAddConvertsItsOptions) {
    EXPECT_EQ(AddSa("sa1", "500").status, 0);
    StartJournal();
    auto r = Run(
        "network ip ipsec sp add -n p1 -a sa1 -s 2001:db8::/48 -d any -p 0 -P 22 -A ipsec -m tunnel -u tcp "
        "-w in");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(Journal("TknCtl::Network::IpSecConfigImpl::StringTo"),
              (Strings{"TknCtl::Network::IpSecConfigImpl::StringToIpSecULProtoType tcp",
                       "TknCtl::Network::IpSecConfigImpl::StringToIpSecDirection in",
                       "TknCtl::Network::IpSecConfigImpl::StringToIpSecAction ipsec",
                       "TknCtl::Network::IpSecConfigImpl::StringToIpSecMode tunnel"}));

    // The mode counts only for "ipsec"; absent options take the documented defaults.
    StartJournal();
    EXPECT_EQ(Run("network ip ipsec sp add -n p2 -s any -d fe80::/10 -p 0 -P 0 -A discard -m tunnel").status,
              0);
    EXPECT_TRUE(Journal("TknCtl::Network::IpSecConfigImpl::StringToIpSecMode").empty());
    EXPECT_EQ(Run("network ip ipsec sp add -n p3 -s any -d any -p 1024 -P 0").status, 0);

    auto list = Json("--formatter=json network ip ipsec sp list");
    EXPECT_EQ(list, nlohmann::json::parse(R"([
      {"Name":"p1","Source Address":"2001:db8::/48","Source Port":0,"Destination Address":"::/0",
       "Destination Port":22,"Protocol":"tcp","Flow":"in","Action":"ipsec","Mode":"tunnel","SA Name":"sa1"},
      {"Name":"p2","Source Address":"::/0","Source Port":0,"Destination Address":"fe80::/10",
       "Destination Port":0,"Protocol":"any","Flow":"out","Action":"discard","Mode":"transport","SA Name":""},
      {"Name":"p3","Source Address":"::/0","Source Port":1024,"Destination Address":"::/0",
       "Destination Port":0,"Protocol":"any","Flow":"out","Action":"ipsec","Mode":"transport","SA Name":""}])"));
}

TEST_F(IpsecTest, SpAddRefusesWhatTheHostCannotHold) {
    EXPECT_EQ(Run("network ip ipsec sp add -n p1 -a nosa -s any -d any -p 0 -P 0").Errors(),
              Strings{"Security Association 'nosa' does not exist"});
    EXPECT_EQ(Run("network ip ipsec sp add -n p1 -s any -d any -p 70000 -P 0").Errors(),
              Strings{"Source port 70000 is out of range: a port is from 0 to 65535 (0 for any)"});
    // Values beyond 32 bits would wrap to a valid port.
    EXPECT_EQ(Run("network ip ipsec sp add -n p1 -s any -d any -p 0 -P 4294967376").Errors(),
              Strings{"Destination port 4294967376 is out of range: a port is from 0 to 65535 (0 for any)"});
    EXPECT_EQ(Run("network ip ipsec sp add -n p1 -s any -d any -p -1 -P 0").Errors(),
              Strings{"Source port -1 is out of range: a port is from 0 to 65535 (0 for any)"});
    EXPECT_EQ(Run("network ip ipsec sp add -n p1 -s any -d any -p 7 -P 0 -u icmp6").Errors(),
              Strings{"ICMPv6 has no ports: give 0 (any) for both ports with icmp6"});
    EXPECT_EQ(Run("network ip ipsec sp add -n p1 -s 2001:db8::1 -d any -p 0 -P 0").Errors(),
              Strings{"Invalid IPv6 network '2001:db8::1' (expected address/prefix length 0-128)"});
    EXPECT_EQ(Run("network ip ipsec sp add -n p1 -s any -d any -p 0 -P 0").status, 0);
    EXPECT_EQ(Run("network ip ipsec sp add -n p1 -s any -d any -p 0 -P 0").Errors(),
              Strings{"Security Policy 'p1' already exists"});
    EXPECT_EQ(Sps().size(), 1u);
}

TEST_F(IpsecTest, SpListMarksPoliciesWhoseSaIsGone) {
    UseFixture();
    EXPECT_EQ(Run("network ip ipsec sp list").Errors(), Strings{});
    EXPECT_EQ(Run("network ip ipsec sa remove -n hour").status, 0);
    auto r = Run("--formatter=json network ip ipsec sp list");
    EXPECT_EQ(r.status, 1);
    auto list = nlohmann::json::parse(r.out);
    ASSERT_EQ(list.size(), 2u);
    EXPECT_EQ(list[0]["SA Name"], "UNKNOWN*");
    EXPECT_EQ(list[1]["SA Name"], "");
    EXPECT_EQ(r.Errors(),
              Strings{"*Some SPs with unique but deleted SAs were found. Please remove these SPs as they "
                      "cannot be used anymore."});
}

TEST_F(IpsecTest, SpRemoveTakesExactlyOneOption) {
    UseFixture();
    for (const char* line : {"network ip ipsec sp remove", "network ip ipsec sp remove -n web -a"}) {
        auto r = Run(line);
        EXPECT_EQ(r.status, 1) << line;
        EXPECT_EQ(r.Errors(), Strings{"You should specify exactly one of : --remove-all, --sp-name"}) << line;
    }
    EXPECT_EQ(Sps().size(), 2u);
    EXPECT_EQ(Run("network ip ipsec sp remove -n nosuch").Errors(),
              Strings{"Security Policy 'nosuch' does not exist"});
    EXPECT_EQ(Run("network ip ipsec sp remove --sp-name web").status, 0);
    EXPECT_EQ(Sps().size(), 1u);
    EXPECT_EQ(Run("network ip ipsec sp remove --remove-all").status, 0);
    EXPECT_TRUE(Sps().empty());
    EXPECT_EQ(Sas().size(), 5u);
}

TEST_F(IpsecTest, HostFailuresBecomeTheirMessage) {
    UseFixture();
    const std::string op = "TknCtl::Network::IpSecConfigImpl::";
    struct Case {
        const char* operation;
        std::string line;
    };
    const Case cases[] = {
        {"AddSADConfig", "network ip ipsec sa add -n x -s any -d any -p 999 -e null -i hmac-sha1 -K k"},
        {"GetSADConfigList", "network ip ipsec sa list"},
        {"RemoveSADConfig", "network ip ipsec sa remove -n minute"},
        {"FlushSADConfig", "network ip ipsec sa remove -a"},
        {"AddSPDConfig", "network ip ipsec sp add -n x -s any -d any -p 0 -P 0"},
        {"GetSPDConfigList", "network ip ipsec sp list"},
        {"RemoveSPDConfig", "network ip ipsec sp remove -n web"},
        {"FlushSPDConfig", "network ip ipsec sp remove -a"},
        {"StringToIpSecAuthAlgo",
         "network ip ipsec sa add -n x -s any -d any -p 999 -e null -i hmac-sha1 -K k"},
    };
    const std::string before = Export();
    for (const auto& c : cases) {
        AddFault(op + c.operation, "", std::string("failed: ") + c.operation, 1);
        auto r = Run(c.line);
        EXPECT_EQ(r.status, 1) << c.line;
        EXPECT_EQ(r.out, "") << c.line;
        EXPECT_EQ(r.Errors(), Strings{std::string("failed: ") + c.operation}) << c.line;
    }
    EXPECT_EQ(Section("ipsec"), nlohmann::json::parse(before)["ipsec"]);
}

}  // namespace

// Sessions: the document's scan, lazy sections, the state file's life cycle.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

#include <nlohmann/json.hpp>

#include "core/digest.h"
#include "core/section.h"
#include "core/store.h"
#include "hostctl/exception.h"
#include "hostctl/session.h"
#include "model/faults.h"
#include "model/ipsettings.h"
#include "model/journal.h"
#include "model/pnics.h"
#include "model/tknnics.h"

using HostCtl::Lib::HostCtlException;
using HostCtl::Lib::HostSession;
using HostCtl::Lib::StateFileError;
using TknCtl::Lib::Read;
using TknCtl::Lib::Write;
namespace Model = TknCtl::Model;
namespace fs = std::filesystem;

namespace {

std::string Slurp(const fs::path& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

void Spill(const fs::path& path, const std::string& text) {
    std::ofstream out(path, std::ios::binary);
    out << text;
}

// The message of the StateFileError that opening text in memory raises, or "".
std::string Refusal(const std::string& text) {
    try {
        auto session = HostSession::InMemory(text);
        TknCtl::Lib::CurrentStore();
    } catch (const StateFileError& e) {
        return e.what();
    }
    return "";
}

class TempDir : public ::testing::Test {
protected:
    void SetUp() override {
        char pattern[] = "/tmp/hostctl-test-XXXXXX";
        ASSERT_NE(mkdtemp(pattern), nullptr);
        dir_ = pattern;
    }
    void TearDown() override { fs::remove_all(dir_); }
    fs::path dir_;
};

// text with the first occurrence of from replaced by to (which must be there).
std::string Edited(std::string text, const std::string& from, const std::string& to) {
    const auto at = text.find(from);
    EXPECT_NE(at, std::string::npos) << from;
    if (at != std::string::npos) text.replace(at, from.size(), to);
    return text;
}

// The line of a document as the library writes it that holds the section.
std::string SectionLine(const std::string& document, const std::string& section) {
    const auto begin = document.find("\n\"" + section + "\":");
    if (begin == std::string::npos) return "";
    return document.substr(begin + 1, document.find('\n', begin + 1) - begin - 1);
}

struct Fingerprint {
    ino_t inode;
    timespec mtime;
    bool operator==(const Fingerprint& o) const {
        return inode == o.inode && mtime.tv_sec == o.mtime.tv_sec && mtime.tv_nsec == o.mtime.tv_nsec;
    }
};

Fingerprint FingerprintOf(const fs::path& path) {
    struct stat info {};
    EXPECT_EQ(stat(path.c_str(), &info), 0);
    return {info.st_ino, info.st_mtim};
}

}  // namespace

TEST(Document, ScanRefusesDamagedText) {
    const std::string good = R"({"version":1,"ipsettings":{"ipv6Enabled":false}})";
    EXPECT_EQ(Refusal(good), "");
    EXPECT_EQ(Refusal(" {\"version\" : 1 } \n"), "");
    struct Case {
        std::string text;
        std::string fault;
    } cases[] = {
        {"", "the document is empty"},
        {" \n\t", "the document is empty"},
        {"[]", "does not begin with '{'"},
        {"hello", "does not begin with '{'"},
        {"{", "truncated document"},
        {R"({"version":1,"ipsettings":{"ipv6Enabled":fal)",
         "truncated document (it ends inside section 'ipsettings')"},
        {R"({"version":1,"ipsettings":{"ipv6Enabled":"x\"}})", "truncated"},
        {R"({"version":1,"ipsettings":{})", "truncated"},
        {R"({"version":1,"ipsettings":[}]})", "mismatched"},
        {R"({"version":1,"ipsettings":{}}})", "unexpected text after the document"},
        {R"({"version":1,"ipsettings":{}} trailing)", "unexpected text after the document"},
        {R"({"version":2})", "unsupported version '2'"},
        {R"({"version":"1"})", "unsupported version"},
        {R"({"version":1.0})", "unsupported version"},
        {R"({"ipsettings":{}})", "no \"version\""},
        {R"({"version":1,"version":1})", "\"version\" appears twice"},
        {R"({"version":1,"ipsettings":{},"ipsettings":{}})", "appears twice"},
        {R"({"version":1,"nosuch":{}})", "unknown section 'nosuch'"},
        {R"({"version":1,"ipsettings"})", "expected ':'"},
        {R"({"version":1 "ipsettings":{}})", "expected ',' or '}'"},
        {R"({"version":1,})", "expected a section name"},
        {R"({"version":1,"ipsettings":})", "missing value"},
        {R"({"version":1,"digests":[]})", "\"digests\": expected an object"},
        {R"({"version":1,"digests":{},"digests":{}})", "\"digests\" appears twice"},
        {R"({"version":1,"digests":{"nosuch":"0123456789abcdef"}})", "\"digests\": unknown section 'nosuch'"},
        {R"({"version":1,"digests":{"ens":"0123456789ABCDEF"}})", "'ens': expected 16 hexadecimal digits"},
        {R"({"version":1,"digests":{"ens":"0123456789abcdef","ens":"0123456789abcdef"}})",
         "'ens' appears twice"},
        {R"({"version":1,"digests":{"ens" "0123456789abcdef"}})", "expected ':' after 'ens'"},
        {R"({"version":1,"digests":{"ens":"0123456789abcdef" "x"}})", "expected ',' or '}' after 'ens'"},
    };
    for (const auto& c : cases) {
        std::string message = Refusal(c.text);
        EXPECT_NE(message.find(c.fault), std::string::npos) << c.text << " -> " << message;
        EXPECT_EQ(message.find('\n'), std::string::npos) << message;
    }
}

TEST(Document, ScanFindsSectionEndsWhereverTheTextFalls) {
    // The scan goes through the text in blocks: quotes, escapes and brackets inside strings
    // must be told apart wherever they fall, at the edge of a block or inside one.
    const std::string tricky = R"([{"a":"q\"]}[{\\","b":"\\","c":["}{][",{"d":"\\\""}]}])";
    for (std::size_t pad = 0; pad < 140; ++pad) {
        const std::string text = "{\"version\":1,\"pnics\":[{\"p\":\"" + std::string(pad, 'x') + "\"}," +
                                 tricky.substr(1) + ",\"ipsettings\":{\"ipv6Enabled\":true}}";
        ASSERT_EQ(Refusal(text), "") << pad;
        {
            auto session = HostSession::InMemory(text);
            EXPECT_TRUE(Read<Model::IpSettingsSection>().ipv6Enabled) << pad;
        }
        // An escaped quote that leaves the string open leaves the document unfinished.
        const std::string open = "{\"version\":1,\"pnics\":[\"" + std::string(pad, 'x') + "\\\"]}";
        EXPECT_NE(Refusal(open).find("truncated document"), std::string::npos) << pad;
        const std::string crossed = "{\"version\":1,\"pnics\":[" + std::string(pad, ' ') + "}]}";
        EXPECT_NE(Refusal(crossed).find("mismatched '}' at byte " + std::to_string(22 + pad)),
                  std::string::npos)
            << Refusal(crossed);
    }
}

TEST(Document, ScanFollowsDeepNesting) {
    std::string open, close;
    for (int level = 0; level < 100; ++level) {
        open += "[{\"a\":";
        close += "}]";
    }
    EXPECT_EQ(Refusal("{\"version\":1,\"pnics\":" + open + "1" + close + "}"), "");
    const std::string crossed = std::string(200, '[') + std::string(199, ']') + "}";
    EXPECT_NE(Refusal("{\"version\":1,\"pnics\":" + crossed + "}").find("mismatched '}' at byte 420"),
              std::string::npos);
}

TEST(Document, SectionsAreParsedWhenTouchedAndCheckedStrictly) {
    // A broken section does not stop a session that never touches it...
    auto session =
        HostSession::InMemory(R"({"version":1,"ipsettings":{"ipv6Enabled":false},"pnics":[1,,2]})");
    EXPECT_FALSE(Read<Model::IpSettingsSection>().ipv6Enabled);
    // ...but touching it refuses the document, naming the section.
    try {
        Read<Model::PnicsSection>();
        FAIL() << "a broken section was accepted";
    } catch (const StateFileError& e) {
        EXPECT_NE(std::string(e.what()).find("in-memory state: pnics: not valid JSON"), std::string::npos)
            << e.what();
    }
    // It is refused again on the next touch: nothing half-loaded stays behind.
    EXPECT_THROW(Read<Model::PnicsSection>(), StateFileError);
}

TEST(Document, ContentErrorsNameTheirPath) {
    struct Case {
        std::string section;
        std::string fault;
    } cases[] = {
        {R"("ipsettings":{"ipv6Enabled":1})", "ipsettings.ipv6Enabled: expected true or false"},
        {R"("ipsettings":{"ipv6Enabled":true,"colour":"red"})", "ipsettings: unknown member 'colour'"},
        {R"("pnics":[{"name":"vmnic0","mtu":-1}])", "pnics[0].mtu: expected an integer from 0 to 4294967295"},
        {R"("pnics":[{"name":"vmnic0","mtu":1.5}])", "pnics[0].mtu: expected an integer"},
        {R"("pnics":[{"mtu":1500}])", "pnics[0]: missing member \"name\""},
        {R"("pnics":[{"name":"vmnic0","mac":"zz"}])", "pnics[0].mac: invalid MAC address 'zz'"},
        {R"("pnics":[{"name":"a"},{"name":"a"}])", "pnics: duplicate NIC name 'a'"},
        {R"("pnics":{})", "pnics: expected an array"},
        {R"("faults":[{"operation":"X","count":0}])", "count of 0"},
        {R"("tknnics":[{"name":"tkn0","netstack":"nosuch"}])", "unknown netstack 'nosuch'"},
        {R"("tknnics":[{"name":"tkn256"}])", "invalid interface name 'tkn256'"},
    };
    for (const auto& c : cases) {
        auto session = HostSession::InMemory("{\"version\":1," + c.section + "}");
        try {
            for (const auto* kind : TknCtl::Lib::AllSections())
                TknCtl::Lib::Access(TknCtl::Lib::CurrentStore(), *kind, false);
            ADD_FAILURE() << "accepted: " << c.section;
        } catch (const StateFileError& e) {
            EXPECT_NE(std::string(e.what()).find(c.fault), std::string::npos)
                << c.section << " -> " << e.what();
        }
    }
}

TEST(Document, UntouchedSectionsKeepTheirBytes) {
    const std::string pnics = R"("pnics": [ {"name" : "vmnic0",   "mtu":1500} ])";
    auto session =
        HostSession::InMemory("{\"version\":1,\n" + pnics + ",\n\"ipsettings\":{\"ipv6Enabled\":true}}");
    Write<Model::IpSettingsSection>().ipv6Enabled = false;
    std::string exported = session->Export();
    EXPECT_NE(exported.find("\"pnics\":[ {\"name\" : \"vmnic0\",   \"mtu\":1500} ]"), std::string::npos)
        << exported;
    EXPECT_NE(exported.find("\"ipsettings\":{\"ipv6Enabled\":false}"), std::string::npos) << exported;
    // A section that was only read is not rewritten either.
    Read<Model::PnicsSection>();
    EXPECT_EQ(session->Export(), exported);
}

TEST(Document, ExportRoundTripsAndOnlyRealChangesCount) {
    auto session = HostSession::InMemoryDefault();
    EXPECT_FALSE(session->HasChanges());
    std::string exported = session->Export();
    // Writing without changing anything is no change.
    Write<Model::PnicsSection>();
    Write<Model::TknNicsSection>();
    EXPECT_FALSE(session->HasChanges());
    EXPECT_EQ(session->Export(), exported);
    Write<Model::PnicsSection>().nics[0].mtu = 9000;
    EXPECT_TRUE(session->HasChanges());
    session->Commit();
    EXPECT_FALSE(session->HasChanges());
    std::string changed = session->Export();
    session.reset();
    // A document as this library writes it reads back to the same document.
    auto again = HostSession::InMemory(changed);
    again->Commit();
    for (const auto* kind : TknCtl::Lib::AllSections())
        TknCtl::Lib::Access(TknCtl::Lib::CurrentStore(), *kind, true);
    EXPECT_EQ(again->Export(), changed);
    EXPECT_EQ(Read<Model::PnicsSection>().nics[0].mtu, 9000u);
}

TEST(Document, DigestsTellTheLibrarysSectionsFromEditedOnes) {
    const std::string written = HostSession::InMemoryDefault()->Export();
    const auto verified = [](const std::string& text) { return TknCtl::Lib::Store(text, "test").Verify(); };
    EXPECT_TRUE(verified(written));
    const std::string digests = SectionLine(written, "digests");
    const std::string ens = SectionLine(written, "ens");
    ASSERT_FALSE(digests.empty());
    ASSERT_FALSE(ens.empty());
    const std::string ensDigest =
        "\"ens\":\"" + nlohmann::json::parse(written)["digests"]["ens"].get<std::string>() + "\"";
    // One byte of a section changed; a section gone, its digest kept; a section without a
    // digest; no digests at all (by hand, or an older version); a digest of another text.
    EXPECT_FALSE(verified(Edited(written, "\"mtu\":1500", "\"mtu\":1501")));
    EXPECT_FALSE(verified(Edited(written, "\n" + ens, "")));
    EXPECT_FALSE(verified(Edited(written, ensDigest + ",", "")));
    EXPECT_FALSE(verified(Edited(written, ",\n" + digests, "")));
    EXPECT_FALSE(verified(Edited(written, ensDigest, "\"ens\":\"0123456789abcdef\"")));
    // Text outside the sections may change.
    EXPECT_TRUE(verified(Edited(written, "\n\"ens\":", "\n  \"ens\" : ")));

    // The digest depends on the bytes and on nothing else: documents move between machines.
    // (Whole blocks of 64 bytes go through vector instructions where there are any.)
    EXPECT_EQ(TknCtl::Lib::DigestText(TknCtl::Lib::Digest("{\"ipv6Enabled\":true}")), "ddb5d6327c2f28f1");
    std::string pattern;
    for (int i = 0; i < 1000; ++i)
        pattern += static_cast<char>(i * 7 + i / 13);
    EXPECT_EQ(TknCtl::Lib::DigestText(TknCtl::Lib::Digest(pattern)), "926113c454f0ea58");
    // Taken piece by piece (as the scan does), the same.
    TknCtl::Lib::Digester pieces;
    pieces.AddBlocks(std::string_view(pattern).substr(0, 640));
    pieces.AddBlocks(std::string_view(pattern).substr(640, 64));
    EXPECT_EQ(pieces.Finish(std::string_view(pattern).substr(704)), TknCtl::Lib::Digest(pattern));
}

TEST(Session, OneAtATimeAndNeededByTheModel) {
    EXPECT_EQ(HostSession::Current(), nullptr);
    EXPECT_THROW(Read<Model::PnicsSection>(), HostCtlException);
    {
        auto session = HostSession::InMemoryDefault();
        EXPECT_EQ(HostSession::Current(), session.get());
        EXPECT_THROW(HostSession::InMemoryDefault(), HostCtlException);
        EXPECT_EQ(Read<Model::PnicsSection>().nics.size(), 7u);
    }
    EXPECT_EQ(HostSession::Current(), nullptr);
}

TEST(Session, ReplaceChecksTheWholeDocumentFirst) {
    auto session = HostSession::InMemoryDefault();
    std::string before = session->Export();
    EXPECT_THROW(session->Replace(R"({"version":1,"tknnics":[{"name":"tkn0","netstack":"x"}]})", "fixture"),
                 StateFileError);
    EXPECT_EQ(session->Export(), before);
    session->Replace(R"({"version":1,"ipsettings":{"ipv6Enabled":false}})", "fixture");
    EXPECT_FALSE(Read<Model::IpSettingsSection>().ipv6Enabled);
    EXPECT_TRUE(Read<Model::PnicsSection>().nics.empty());
    session->Reset();
    EXPECT_EQ(session->Export(), before);
}

TEST(StatePath, GivenThenEnvironmentThenHome) {
    EXPECT_EQ(HostCtl::Lib::ResolveStatePath("/x/y.json"), "/x/y.json");
    setenv("HADRO_STATE", "/from/env.json", 1);
    EXPECT_EQ(HostCtl::Lib::ResolveStatePath(""), "/from/env.json");
    unsetenv("HADRO_STATE");
    setenv("XDG_STATE_HOME", "/xdg", 1);
    EXPECT_EQ(HostCtl::Lib::ResolveStatePath(""), "/xdg/hadro/host.json");
    setenv("XDG_STATE_HOME", "relative", 1);  // not absolute: ignored
    setenv("HOME", "/home/someone", 1);
    EXPECT_EQ(HostCtl::Lib::ResolveStatePath(""), "/home/someone/.local/state/hadro/host.json");
    unsetenv("XDG_STATE_HOME");
    EXPECT_EQ(HostCtl::Lib::ResolveStatePath(""), "/home/someone/.local/state/hadro/host.json");
}

TEST_F(TempDir, MissingFileStartsFromTheDefaultHostAndIsCreatedPrivately) {
    fs::path path = dir_ / "a" / "b" / "host.json";
    {
        auto session = HostSession::OpenFile(path);
        EXPECT_EQ(session->GetPath(), path.string());
        EXPECT_FALSE(fs::exists(path));
        session->Commit();
    }
    ASSERT_TRUE(fs::exists(path));
    EXPECT_EQ(fs::status(path).permissions() & fs::perms::all,
              fs::perms::owner_read | fs::perms::owner_write);
    EXPECT_EQ(fs::status(dir_ / "a").permissions() & fs::perms::all, fs::perms::owner_all);
    auto memory = HostSession::InMemoryDefault();
    EXPECT_EQ(Slurp(path), memory->Export());
}

TEST_F(TempDir, CommitWritesOnlyWhenSomethingChanged) {
    fs::path path = dir_ / "host.json";
    HostSession::OpenFile(path)->Commit();
    Fingerprint before = FingerprintOf(path);
    {
        auto session = HostSession::OpenFile(path);
        Read<Model::PnicsSection>();
        Write<Model::JournalSection>();  // asked for, left as it was
        session->Commit();
    }
    EXPECT_TRUE(FingerprintOf(path) == before);
    {
        auto session = HostSession::OpenFile(path);
        Write<Model::IpSettingsSection>().ipv6Enabled = false;
        // The destructor releases the lock without committing.
    }
    EXPECT_TRUE(FingerprintOf(path) == before);
    {
        auto session = HostSession::OpenFile(path);
        Write<Model::IpSettingsSection>().ipv6Enabled = false;
        session->Commit();
        session->Commit();  // nothing new: no second write
    }
    EXPECT_FALSE(FingerprintOf(path) == before);
    EXPECT_NE(Slurp(path).find("\"ipsettings\":{\"ipv6Enabled\":false}"), std::string::npos);
    // The permissions a user gave the file are kept.
    fs::permissions(path, fs::perms::owner_read | fs::perms::owner_write | fs::perms::group_read);
    {
        auto session = HostSession::OpenFile(path);
        Write<Model::IpSettingsSection>().ipv6Enabled = true;
        session->Commit();
    }
    EXPECT_EQ(fs::status(path).permissions() & fs::perms::all,
              fs::perms::owner_read | fs::perms::owner_write | fs::perms::group_read);
}

TEST_F(TempDir, DamagedFilesAreRefusedAndLeftAlone) {
    fs::path path = dir_ / "host.json";
    const std::string damaged = R"({"version":1,"pnics":[{"name":"vmnic0"},{"name":"vmnic0"}]})";
    Spill(path, damaged);
    try {
        // Written by hand (no digests): checked in full before it is used.
        HostSession::OpenFile(path);
        FAIL() << "duplicate NIC names accepted";
    } catch (const StateFileError& e) {
        EXPECT_EQ(std::string(e.what()),
                  "state file " + path.string() + ": pnics: duplicate NIC name 'vmnic0'");
    }
    EXPECT_EQ(Slurp(path), damaged);
    Spill(path, "{\"version\":1,");
    try {
        HostSession::OpenFile(path);
        FAIL() << "a truncated file was accepted";
    } catch (const StateFileError& e) {
        EXPECT_NE(std::string(e.what()).find("state file " + path.string() + ": truncated"),
                  std::string::npos);
    }
    EXPECT_EQ(Slurp(path), "{\"version\":1,");
    EXPECT_EQ(HostSession::Current(), nullptr);
    // A session opened to replace the document does not read it: reset repairs the file.
    {
        auto session = HostSession::OpenFile(path, HostSession::OpenMode::kReplace);
        session->Reset();
        session->Commit();
    }
    EXPECT_EQ(Slurp(path), HostSession::InMemoryDefault()->Export());
}

TEST_F(TempDir, ASectionEditedOutsideTheLibraryIsCheckedBeforeTheFileIsUsed) {
    fs::path path = dir_ / "host.json";
    HostSession::OpenFile(path)->Commit();
    const std::string written = Slurp(path);
    // Damage where the session never looks is refused all the same, before anything runs,
    // and the file is left byte for byte.
    struct Damage {
        std::string from, to, fault;
    } damages[] = {
        {"\"vswitches\":[", "\"vswitches\":[1,,", "vswitches: not valid JSON"},
        {"\"name\":\"vSwitch1\"", "\"name\":\"vSwitch0\"", "vswitches: duplicate switch name 'vSwitch0'"},
        {"\"worldId\":2110231", "\"worldId\":42", "ports: port 33554437: unknown world 42"},
    };
    for (const auto& d : damages) {
        const std::string damaged = Edited(written, d.from, d.to);
        Spill(path, damaged);
        try {
            auto session = HostSession::OpenFile(path);
            Write<Model::IpSettingsSection>().ipv6Enabled = false;
            session->Commit();
            ADD_FAILURE() << "accepted: " << d.to;
        } catch (const StateFileError& e) {
            EXPECT_NE(std::string(e.what()).find("state file " + path.string() + ": " + d.fault),
                      std::string::npos)
                << e.what();
        }
        EXPECT_EQ(Slurp(path), damaged);
        EXPECT_EQ(HostSession::Current(), nullptr);
    }
    // A valid hand edit is taken. At the next commit the edited section gets its digest, a
    // changed one a new one, and the others keep theirs.
    const std::string edited = Edited(written, "\"mtu\":1500,\"cdpStatus\"", "\"mtu\":9000,\"cdpStatus\"");
    Spill(path, edited);
    {
        auto session = HostSession::OpenFile(path);
        Write<Model::IpSettingsSection>().ipv6Enabled = false;
        session->Commit();
    }
    const std::string after = Slurp(path);
    EXPECT_EQ(SectionLine(after, "vswitches"), SectionLine(edited, "vswitches"));
    const auto before = nlohmann::json::parse(written)["digests"];
    const auto now = nlohmann::json::parse(after)["digests"];
    EXPECT_NE(now["vswitches"], before["vswitches"]);
    EXPECT_NE(now["ipsettings"], before["ipsettings"]);
    EXPECT_EQ(now.size(), before.size());
    for (const auto& section : {"pnics", "dvswitches", "ports", "journal"})
        EXPECT_EQ(now[section], before[section]) << section;
    EXPECT_TRUE(TknCtl::Lib::Store(after, "test").Verify());
    // Without any digests (by hand, or from an older version): checked, taken, and written
    // back with them at the next change.
    Spill(path, Edited(written, ",\n" + SectionLine(written, "digests"), ""));
    {
        auto session = HostSession::OpenFile(path);
        Write<Model::IpSettingsSection>().ipv6Enabled = false;
        session->Commit();
    }
    EXPECT_TRUE(TknCtl::Lib::Store(Slurp(path), "test").Verify());
}

TEST_F(TempDir, LockFileIsNotFollowedThroughASymlink) {
    fs::path path = dir_ / "host.json";
    fs::create_symlink(dir_ / "elsewhere", dir_ / "host.json.lock");
    EXPECT_THROW(HostSession::OpenFile(path), StateFileError);
    EXPECT_FALSE(fs::exists(dir_ / "elsewhere"));
}

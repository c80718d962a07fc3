// The Linux host's configuration file and its own document, without a kernel.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>
#include <sstream>

#include "core/config.h"
#include "core/document.h"
#include "hostctl/session.h"

namespace {

using HostCtl::Lib::StateFileError;
using TknCtl::Linux::Config;
using TknCtl::Linux::Document;
namespace fs = std::filesystem;

template <class F>
std::string Refusal(F&& f) {
    try {
        f();
    } catch (const StateFileError& e) {
        return e.what();
    }
    return {};
}

std::string Slurp(const fs::path& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

TEST(LinuxConfig, KeysValuesCommentsAndRefusalsWithTheirLine) {
    auto config =
        Config::Parse("# NICs of a test host\n\n  nics = eth* ens3 \nstate=/srv/hadro.json\n", "linux.conf");
    EXPECT_EQ(config.nics, (std::vector<std::string>{"eth*", "ens3"}));
    EXPECT_EQ(config.statePath, "/srv/hadro.json");
    EXPECT_TRUE(config.NamesNic("eth12"));
    EXPECT_TRUE(config.NamesNic("ens3"));
    EXPECT_FALSE(config.NamesNic("ens33"));
    EXPECT_EQ(Config::Parse("", "empty").statePath, Config::kDefaultState);

    EXPECT_EQ(Refusal([] { Config::Parse("nics = a\ncolour = blue\n", "linux.conf"); }),
              "configuration linux.conf: line 2: unknown key 'colour' (known: nics, state)");
    EXPECT_EQ(Refusal([] { Config::Parse("# fine\nnics eth0\n", "linux.conf"); }),
              "configuration linux.conf: line 2: expected 'key = value'");
    EXPECT_EQ(Refusal([] { Config::Parse("= eth0\n", "linux.conf"); }),
              "configuration linux.conf: line 1: expected 'key = value'");
    EXPECT_EQ(Refusal([] { Config::Parse("state = relative.json\n", "linux.conf"); }),
              "configuration linux.conf: line 1: state must be an absolute path");
}

class LinuxDocument : public ::testing::Test {
protected:
    void SetUp() override {
        dir_ = fs::temp_directory_path() / ("hadro-document-" + std::to_string(getpid()));
        fs::create_directories(dir_);
        path_ = dir_ / "sub" / "linux.json";
    }
    void TearDown() override { fs::remove_all(dir_); }
    fs::path dir_;
    fs::path path_;
};

TEST_F(LinuxDocument, AChangeIsWrittenOnceLockedReadableByAllAndReadBack) {
    {
        Document document(path_.string());
        EXPECT_TRUE(document.Read("tags").is_null());
        EXPECT_FALSE(document.HasChanges());
        document.Write("tags")["eth0"] = {"Management"};
        EXPECT_TRUE(document.IsLocked());
        EXPECT_TRUE(document.HasChanges());
        document.Commit();
        EXPECT_FALSE(document.HasChanges());
    }
    struct stat info {};
    ASSERT_EQ(stat(path_.c_str(), &info), 0);
    EXPECT_EQ(info.st_mode & 0777, 0644u);
    Document again(path_.string());
    EXPECT_EQ(again.Read("tags")["eth0"][0], "Management");
    EXPECT_EQ(nlohmann::json::parse(Slurp(path_))["version"], 1);

    // Forgotten changes are not written.
    again.Write("tags")["eth1"] = {"Storage"};
    again.Discard();
    again.Commit();
    EXPECT_EQ(Slurp(path_).find("eth1"), std::string::npos);
}

TEST_F(LinuxDocument, ADamagedDocumentIsRefusedNamingItAndKeptByteForByte) {
    fs::create_directories(path_.parent_path());
    for (const std::string damaged :
         {"{\"version\":1, \"tags\": [", "[1,2]", "{\"tags\":{}}", "{\"version\":7}"}) {
        std::ofstream(path_, std::ios::binary | std::ios::trunc) << damaged;
        Document document(path_.string());
        std::string refusal = Refusal([&] { document.Read("tags"); });
        EXPECT_EQ(refusal.rfind("Linux host document " + path_.string() + ": ", 0), 0u) << refusal;
        EXPECT_EQ(Refusal([&] { document.Write("tags")["x"] = 1; }).empty(), false);
        EXPECT_EQ(Slurp(path_), damaged);
    }
    std::ofstream(path_, std::ios::binary | std::ios::trunc) << "{\"version\":1,\"tags\":{}}";
    Document document(path_.string());
    EXPECT_EQ(Refusal([&] { document.Refuse("tags", "'eth0' is not a list"); }),
              "Linux host document " + path_.string() + ": tags: 'eth0' is not a list");
}

}  // namespace

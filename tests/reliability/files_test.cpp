// Files: the state file, its lock and the temporary file of a write are created mode 0600
// whatever the umask; a temporary file is created with O_EXCL | O_NOFOLLOW, and no file of
// the state directory is ever opened through a symbolic link planted there; an EEPROM file
// is refused by its size before it is read.
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <sstream>

#include "harness.h"

namespace {

namespace fs = std::filesystem;

struct Output {
    int status = -1;
    std::string err;
};

std::string ReadAll(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), {});
}

class FilesTest : public Hadro::Test::CommandTest {
protected:
    void SetUp() override {
        CommandTest::SetUp();
        dir_ = (fs::temp_directory_path() / ("hadro-files-" + std::to_string(getpid()))).string();
        fs::remove_all(dir_);
        fs::create_directories(dir_);
    }
    void TearDown() override {
        fs::remove_all(dir_);
        CommandTest::TearDown();
    }

    // hadrocli with umask 0 (and extra environment), stderr kept.
    Output Cli(std::vector<std::string> args, const std::vector<std::string>& env = {}) {
        const std::string errPath = dir_ + "/stderr";
        pid_t pid = fork();
        if (pid == 0) {
            umask(0);
            int err = open(errPath.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
            int null = open("/dev/null", O_WRONLY);
            dup2(null, 1);
            dup2(err, 2);
            for (const auto& e : env) putenv(const_cast<char*>(e.c_str()));
            std::vector<char*> argv{const_cast<char*>(HADROCLI)};
            for (auto& arg : args) argv.push_back(arg.data());
            argv.push_back(nullptr);
            execv(HADROCLI, argv.data());
            _exit(127);
        }
        int status = 0;
        waitpid(pid, &status, 0);
        return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, ReadAll(errPath)};
    }

    static unsigned Mode(const std::string& path) {
        struct stat info {};
        return lstat(path.c_str(), &info) == 0 ? info.st_mode & 07777 : 0;
    }

    std::string dir_;
};

TEST_F(FilesTest, StateLockAndDirectoryArePrivateWhateverTheUmask) {
    const std::string state = dir_ + "/new/state/host.json";
    ASSERT_EQ(Cli({"--state=" + state, "network", "ip", "dns", "server", "add", "-s", "10.1.1.1"}).status, 0);
    EXPECT_EQ(Mode(state), 0600u);
    EXPECT_EQ(Mode(state + ".lock"), 0600u);
    EXPECT_EQ(Mode(dir_ + "/new/state"), 0700u);
    EXPECT_EQ(Mode(dir_ + "/new"), 0700u);
    // A state file the owner made readable to the group keeps that mode through a write.
    ASSERT_EQ(chmod(state.c_str(), 0640), 0);
    ASSERT_EQ(Cli({"--state=" + state, "network", "ip", "dns", "server", "remove", "-s", "10.1.1.1"}).status, 0);
    EXPECT_EQ(Mode(state), 0640u);
    EXPECT_EQ(ReadAll(state).find("10.1.1.1"), std::string::npos);
}

TEST_F(FilesTest, PlantedSymbolicLinksAreNeverFollowed) {
    const std::string state = dir_ + "/host.json", victim = dir_ + "/victim";
    std::ofstream(victim) << "precious\n";
    ASSERT_EQ(chmod(victim.c_str(), 0644), 0);

    // The lock file as a link: refused, the target left alone.
    ASSERT_EQ(symlink(victim.c_str(), (state + ".lock").c_str()), 0);
    auto refused = Cli({"--state=" + state, "network", "ip", "dns", "server", "add", "-s", "10.1.1.2"});
    EXPECT_EQ(refused.status, 3);
    EXPECT_NE(refused.err.find("cannot open lock file " + state + ".lock"), std::string::npos) << refused.err;
    EXPECT_FALSE(fs::exists(state));
    ASSERT_EQ(unlink((state + ".lock").c_str()), 0);

    // Links named like temporary files of an earlier writer: removed, never written through.
    ASSERT_EQ(Cli({"--state=" + state, "network", "ip", "get"}).status, 0);
    for (const char* name : {"/.host.json.tmp.1.0.1", "/.host.json.tmp.evil"})
        ASSERT_EQ(symlink(victim.c_str(), (dir_ + name).c_str()), 0);
    ASSERT_EQ(Cli({"--state=" + state, "network", "ip", "dns", "server", "add", "-s", "10.1.1.2"}).status, 0);
    EXPECT_EQ(ReadAll(victim), "precious\n");
    EXPECT_EQ(Mode(victim), 0644u);
    EXPECT_FALSE(fs::is_symlink(dir_ + "/.host.json.tmp.evil"));
    EXPECT_NE(ReadAll(state).find("10.1.1.2"), std::string::npos);

    // The state file itself as a link to a file that is no state document: refused, left alone.
    ASSERT_EQ(unlink(state.c_str()), 0);
    ASSERT_EQ(symlink(victim.c_str(), state.c_str()), 0);
    EXPECT_EQ(Cli({"--state=" + state, "network", "ip", "dns", "server", "add", "-s", "10.1.1.3"}).status, 3);
    EXPECT_EQ(ReadAll(victim), "precious\n");
}

// Every file hadrocli creates in the state directory, as seen by a spy on open(): mode 0600,
// O_NOFOLLOW; the temporary file also O_EXCL.
TEST_F(FilesTest, EveryFileIsCreatedExclusivelyWithoutFollowingLinks) {
#if defined(__SANITIZE_ADDRESS__)
    GTEST_SKIP() << "the sanitizer runtime intercepts open() before a preloaded spy could";
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
    GTEST_SKIP() << "the sanitizer runtime intercepts open() before a preloaded spy could";
#endif
#endif
    const std::string state = dir_ + "/host.json", log = dir_ + "/opens.log";
    const std::vector<std::string> env = {"LD_PRELOAD=" OPEN_SPY, "OPEN_SPY_LOG=" + log};
    ASSERT_EQ(Cli({"--state=" + state, "network", "ip", "dns", "server", "add", "-s", "10.1.1.4"}, env).status, 0);
    ASSERT_EQ(Cli({"--state=" + state, "network", "ip", "dns", "server", "remove", "-s", "10.1.1.4"}, env).status, 0);

    std::istringstream lines(ReadAll(log));
    int created = 0, temporary = 0;
    for (std::string line; std::getline(lines, line);) {
        std::istringstream fields(line);
        int flags = 0;
        unsigned mode = 0;
        std::string path;
        fields >> flags >> std::oct >> mode >> std::ws;
        std::getline(fields, path);
        if (path.rfind(dir_ + "/", 0) != 0 || path == log) continue;
        if (!(flags & O_CREAT)) continue;
        ++created;
        EXPECT_EQ(mode, 0600u) << path;
        EXPECT_TRUE(flags & O_NOFOLLOW) << path;
        if (path.find("/.host.json.tmp.") != std::string::npos) {
            ++temporary;
            EXPECT_TRUE(flags & O_EXCL) << path;
        }
    }
    EXPECT_EQ(temporary, 2);    // one per write
    EXPECT_GE(created, 4);      // and the lock, each time
}

TEST_F(FilesTest, AHugeEepromFileIsRefusedByItsSize) {
    const std::string huge = dir_ + "/huge.bin";
    {
        std::ofstream out(huge);
    }
    fs::resize_file(huge, 1ull << 34);  // 16 GiB, sparse
    auto r = Run(std::vector<std::string>{"network", "nic", "eeprom", "change", "-n", "vmnic2", "-m", "1212436038",
                                          "-f", huge});
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "EEPROM file " + huge + " (17179869184 bytes) is larger than the EEPROM of vmnic2 (64 bytes)\n");
}

}  // namespace

#include "namespace_host.h"

#include <dirent.h>
#include <sched.h>
#include <stdlib.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <sstream>

namespace Hadro::Test {

std::string Slurp(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

namespace {

void Spill(const std::string& path, const std::string& text) {
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out << text;
}

std::string Quoted(const std::string& text) {
    std::string out = "'";
    for (char c : text) {
        if (c == '\'') {
            out += "'\\''";
        } else {
            out += c;
        }
    }
    return out + "'";
}

// The private mount namespace of this test process, entered once; empty when it was made,
// else why it could not be.
const std::string& PrivateMounts() {
    static const std::string why = [] {
        if (geteuid() != 0) return std::string("the tests of the Linux host need root to build namespaces");
        if (unshare(CLONE_NEWNS) != 0)
            return std::string("cannot make a mount namespace: ") + std::strerror(errno);
        if (mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0)
            return std::string("cannot make the mounts private: ") + std::strerror(errno);
        return std::string();
    }();
    return why;
}

std::string Mount(const char* source, const char* target, const char* type, const std::string& data = {}) {
    if (mount(source, target, type, 0, data.empty() ? nullptr : data.c_str()) != 0)
        return std::string("cannot mount ") + type + " on " + target + ": " + std::strerror(errno);
    return {};
}

}  // namespace

void NamespaceHostTest::SetUp() {
    if (const auto& why = PrivateMounts(); !why.empty()) {
        std::cout << "[  SKIPPED ] " << why << '\n';
        GTEST_SKIP() << why;
    }
    if (unshare(CLONE_NEWNET) != 0)
        GTEST_SKIP() << "cannot make a network namespace: " << std::strerror(errno);

    std::string pattern = (std::filesystem::temp_directory_path() / "hadro-linux-XXXXXX").string();
    ASSERT_NE(mkdtemp(pattern.data()), nullptr);
    dir_ = pattern;
    // Readable by the unprivileged user of HadroUnprivileged.
    chmod(dir_.c_str(), 0755);
    std::filesystem::create_directories(dir_ + "/etc-upper");
    std::filesystem::create_directories(dir_ + "/etc-work");

    // This namespace's interfaces in /sys/class/net; a /run and an /etc of the test's own.
    for (const auto& fault :
         {Mount("sysfs", "/sys", "sysfs"), Mount("tmpfs", "/run", "tmpfs", "mode=0755"),
          Mount("overlay", "/etc", "overlay",
                "lowerdir=/etc,upperdir=" + dir_ + "/etc-upper,workdir=" + dir_ + "/etc-work")}) {
        ASSERT_TRUE(fault.empty()) << fault;
    }
    mkdir("/run/netns", 0755);
    unlink("/etc/resolv.conf");
    Spill("/etc/resolv.conf", "# the test host's resolver\nnameserver 192.0.2.53\noptions ndots:2\n");

    document_ = dir_ + "/linux.json";
    Spill(dir_ + "/linux.conf", "");
    setenv("HADRO_LINUX_CONF", (dir_ + "/linux.conf").c_str(), 1);
    setenv("HADRO_LINUX_STATE", document_.c_str(), 1);
    unsetenv("HADRO_BACKEND");
    Sh("ip link set lo up");
}

void NamespaceHostTest::TearDown() {
    if (dir_.empty()) return;
    // Named namespaces are bound under the test's /run/netns: unbind them so they go.
    if (DIR* netns = opendir("/run/netns")) {
        while (const dirent* entry = readdir(netns)) {
            std::string path = std::string("/run/netns/") + entry->d_name;
            if (entry->d_name[0] == '.') continue;
            umount2(path.c_str(), MNT_DETACH);
            unlink(path.c_str());
        }
        closedir(netns);
    }
    umount2("/etc", MNT_DETACH);
    umount2("/run", MNT_DETACH);
    umount2("/sys", MNT_DETACH);
    std::error_code ignored;
    std::filesystem::remove_all(dir_, ignored);
}

HostResult NamespaceHostTest::Try(const std::string& command) {
    const std::string out = dir_ + "/stdout", err = dir_ + "/stderr";
    const std::string line = "(" + command + ") >" + Quoted(out) + " 2>" + Quoted(err) + " </dev/null";
    const int raw = std::system(line.c_str());
    HostResult result;
    result.status = raw != -1 && WIFEXITED(raw) ? WEXITSTATUS(raw) : -1;
    result.out = Slurp(out);
    result.err = Slurp(err);
    return result;
}

std::string NamespaceHostTest::Sh(const std::string& command) {
    auto result = Try(command);
    EXPECT_EQ(result.status, 0) << command << "\n" << result.All();
    return result.out;
}

nlohmann::json NamespaceHostTest::ShJson(const std::string& command) {
    std::string out = Sh(command);
    auto parsed = nlohmann::json::parse(out, nullptr, false);
    EXPECT_FALSE(parsed.is_discarded()) << command << " printed no JSON:\n" << out;
    return parsed;
}

HostResult NamespaceHostTest::Hadro(const std::string& arguments) {
    return Try(std::string("'") + HADROCLI + "' --plugin-dir='" + HADRO_PLUGIN_DIR + "' --backend=linux " +
               arguments);
}

nlohmann::json NamespaceHostTest::HadroJson(const std::string& arguments) {
    auto result = Hadro("--formatter=json " + arguments);
    EXPECT_EQ(result.status, 0) << arguments << "\n" << result.All();
    auto parsed = nlohmann::json::parse(result.out, nullptr, false);
    EXPECT_FALSE(parsed.is_discarded()) << arguments << " printed no JSON:\n" << result.All();
    return parsed;
}

HostResult NamespaceHostTest::HadroUnprivileged(const std::string& arguments) {
    return Try(std::string("setpriv --reuid=nobody --regid=nogroup --clear-groups --inh-caps=-all '") +
               HADROCLI + "' --plugin-dir='" + HADRO_PLUGIN_DIR + "' --backend=linux " + arguments);
}

void NamespaceHostTest::Configure(const std::string& text) {
    Spill(dir_ + "/linux.conf", text);
}

}  // namespace Hadro::Test

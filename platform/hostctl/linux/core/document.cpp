#include "core/document.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <nlohmann/json.hpp>

#include "hostctl/session.h"
#include "kernel/dryrun.h"

namespace TknCtl::Linux {

using HostCtl::Lib::StateFileError;
using nlohmann::json;

namespace {

constexpr int kVersion = 1;
constexpr off_t kMaxSize = 64 * 1024 * 1024;

std::string DirectoryOf(const std::string& path) {
    auto slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    if (slash == 0) return "/";
    return path.substr(0, slash);
}

void MakeDirectories(const std::string& dir) {
    struct stat info {};
    if (dir.empty() || stat(dir.c_str(), &info) == 0) return;
    MakeDirectories(DirectoryOf(dir));
    mkdir(dir.c_str(), 0755);
}

}  // namespace

Document::Document(std::string path) : path_(std::move(path)) {}

Document::~Document() {
    if (lockFd_ >= 0) close(lockFd_);
}

void Document::Refuse(const std::string& member, const std::string& fault) const {
    throw StateFileError("Linux host document " + path_ + ": " + (member.empty() ? "" : member + ": ") +
                         fault);
}

void Document::Load() {
    loaded_ = true;
    existed_ = false;
    base_ = std::make_unique<json>(json::object());
    int fd = open(path_.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    if (fd < 0) {
        if (errno == ENOENT) {
            current_ = std::make_unique<json>(*base_);
            return;
        }
        Refuse({}, std::string("cannot read: ") + std::strerror(errno));
    }
    struct stat info {};
    if (fstat(fd, &info) != 0 || !S_ISREG(info.st_mode) || info.st_size > kMaxSize) {
        close(fd);
        Refuse({}, "not a regular file of a sensible size");
    }
    std::string text;
    char buffer[65536];
    while (true) {
        ssize_t n = read(fd, buffer, sizeof(buffer));
        if (n < 0 && errno == EINTR) continue;
        if (n < 0) {
            int error = errno;
            close(fd);
            Refuse({}, std::string("cannot read: ") + std::strerror(error));
        }
        if (n == 0) break;
        text.append(buffer, static_cast<std::size_t>(n));
    }
    close(fd);
    existed_ = true;
    json parsed = json::parse(text, nullptr, false);
    if (parsed.is_discarded()) Refuse({}, "not valid JSON");
    if (!parsed.is_object()) Refuse({}, "not a JSON object");
    auto version = parsed.find("version");
    if (version == parsed.end() || !version->is_number_integer() || version->get<long long>() != kVersion)
        Refuse({}, "no \"version\": " + std::to_string(kVersion));
    *base_ = std::move(parsed);
    current_ = std::make_unique<json>(*base_);
}

const json& Document::Read(const std::string& member) {
    static const json null;
    if (!loaded_) Load();
    auto it = current_->find(member);
    return it == current_->end() ? null : *it;
}

json& Document::Write(const std::string& member) {
    // A dry run changes the document in memory only, and takes no lock (it writes no file).
    if (!IsLocked() && !Kernel::DryRun()) Lock();
    if (!loaded_) Load();
    return (*current_)[member];
}

void Document::Lock() {
    if (lockFd_ >= 0) return;
    MakeDirectories(DirectoryOf(path_));
    std::string lockPath = path_ + ".lock";
    lockFd_ = open(lockPath.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0644);
    if (lockFd_ < 0) Refuse({}, "cannot open lock file " + lockPath + ": " + std::strerror(errno));
    while (flock(lockFd_, LOCK_EX) != 0) {
        if (errno != EINTR) {
            int error = errno;
            close(lockFd_);
            lockFd_ = -1;
            Refuse({}, "cannot lock " + lockPath + ": " + std::strerror(error));
        }
    }
    Load();
}

bool Document::HasChanges() const {
    return loaded_ && *current_ != *base_;
}

void Document::Discard() {
    if (loaded_) *current_ = *base_;
}

void Document::Commit() {
    if (!HasChanges()) return;
    if (Kernel::DryRun()) {
        // Kept in memory (the next command of a batch sees it); the line says what would be written.
        std::string members;
        for (const auto& [member, value] : current_->items()) {
            auto before = base_->find(member);
            if (before == base_->end() || *before != value) members += (members.empty() ? "" : ", ") + member;
        }
        for (const auto& [member, value] : base_->items()) {
            if (!current_->contains(member)) members += (members.empty() ? "" : ", ") + member;
        }
        Kernel::Record("file write " + path_ + " (the host's document: " + members + ")");
        *base_ = *current_;
        return;
    }
    if (!IsLocked()) Refuse({}, "changed without its lock");
    (*current_)["version"] = kVersion;
    std::string text = current_->dump(2) + "\n";
    std::string dir = DirectoryOf(path_);
    std::string temp = path_ + ".tmp." + std::to_string(getpid());
    int fd = open(temp.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, 0644);
    if (fd < 0) Refuse({}, "cannot write: " + temp + ": " + std::strerror(errno));
    auto abandon = [&](const char* step) {
        int error = errno;
        close(fd);
        unlink(temp.c_str());
        Refuse({}, std::string("cannot write: ") + step + ": " + std::strerror(error));
    };
    if (fchmod(fd, 0644) != 0) abandon("cannot set the mode");
    std::size_t done = 0;
    while (done < text.size()) {
        ssize_t n = write(fd, text.data() + done, text.size() - done);
        if (n < 0 && errno == EINTR) continue;
        if (n < 0) abandon("write failed");
        done += static_cast<std::size_t>(n);
    }
    if (fsync(fd) != 0) abandon("fsync failed");
    if (close(fd) != 0) {
        int error = errno;
        unlink(temp.c_str());
        Refuse({}, std::string("cannot write: close failed: ") + std::strerror(error));
    }
    if (rename(temp.c_str(), path_.c_str()) != 0) {
        int error = errno;
        unlink(temp.c_str());
        Refuse({}, std::string("cannot write: rename failed: ") + std::strerror(error));
    }
    if (int dirFd = open(dir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC); dirFd >= 0) {
        fsync(dirFd);
        close(dirFd);
    }
    *base_ = *current_;
    existed_ = true;
}

}  // namespace TknCtl::Linux

#include "hostctl/session.h"

#include <dirent.h>
#include <fcntl.h>
#include <pwd.h>
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <string_view>
#include <vector>

#include "core/backend.h"
#include "core/embedded.h"
#include "core/hook.h"
#include "core/store.h"
#include "core/text.h"
#include "hostctl/exception.h"

namespace HostCtl::Lib {

using TknCtl::Lib::Printable;
using TknCtl::Lib::Store;

StateFileError::StateFileError(std::string message) : message_(Printable(message)) {}
StateFileError::~StateFileError() = default;

DryRunEnd::DryRunEnd(std::string next) : next_(std::move(next)) {}
DryRunEnd::~DryRunEnd() = default;

namespace {

// A state file larger than this is refused rather than read into memory.
constexpr off_t kMaxStateSize = 256 * 1024 * 1024;

HostSession* g_current = nullptr;
Store* g_store = nullptr;                     // the current session's document (simulated host)
TknCtl::Backend::Host* g_realHost = nullptr;  // the current session's real host

// What a dry run recorded (HostSession::StartDryRun).
struct DryRunLog {
    std::vector<std::string> lines;
    bool stopped = false;  // the dry run went as far as it could: nothing more is recorded

    void Record(std::string line, bool last) {
        if (stopped) return;
        lines.push_back(std::move(line));
        stopped = last;
    }
};
DryRunLog* g_dryRun = nullptr;  // the current session's, while it is a dry run

[[noreturn]] void NotOnRealHost(const char* what) {
    throw StateFileError(std::string(what) + " concerns the simulated host's state file, not the " +
                         g_realHost->Describe());
}

std::string ErrnoText(int error) {
    return std::strerror(error);
}

std::string Origin(const std::string& path) {
    return "state file " + path;
}

[[noreturn]] void Fail(const std::string& path, const std::string& fault) {
    throw StateFileError(Origin(path) + ": " + fault);
}

std::string DirectoryOf(const std::string& path) {
    auto slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    if (slash == 0) return "/";
    return path.substr(0, slash);
}

std::string BaseOf(const std::string& path) {
    auto slash = path.rfind('/');
    return slash == std::string::npos ? path : path.substr(slash + 1);
}

// Creates the directory and its missing parents (mode 0700).
void MakeDirectories(const std::string& path, const std::string& stateFile) {
    struct stat info {};
    if (path.empty() || stat(path.c_str(), &info) == 0) return;
    MakeDirectories(DirectoryOf(path), stateFile);
    if (mkdir(path.c_str(), 0700) != 0 && errno != EEXIST) {
        Fail(stateFile, "cannot create directory " + path + ": " + ErrnoText(errno));
    }
}

// Writes the pieces one after another, many at a time; false (errno set) on failure.
bool WriteAll(int fd, const std::vector<std::string_view>& pieces) {
    std::vector<iovec> vectors;
    for (auto piece : pieces) {
        if (!piece.empty()) vectors.push_back({const_cast<char*>(piece.data()), piece.size()});
    }
    std::size_t next = 0;
    while (next < vectors.size()) {
        const int count = static_cast<int>(std::min<std::size_t>(vectors.size() - next, IOV_MAX));
        ssize_t n = writev(fd, vectors.data() + next, count);
        if (n < 0) {
            if (errno == EINTR) continue;
            return false;
        }
        // Skip what was written; a short write leaves the rest of a piece for the next call.
        auto left = static_cast<std::size_t>(n);
        while (next < vectors.size() && left >= vectors[next].iov_len) {
            left -= vectors[next].iov_len;
            ++next;
        }
        if (left > 0) {
            vectors[next].iov_base = static_cast<char*>(vectors[next].iov_base) + left;
            vectors[next].iov_len -= left;
        }
    }
    return true;
}

// Reads the whole file into out; returns the fault, or "" on success. Documents of a
// megabyte or more go into memory backed by huge pages where the system offers them:
// otherwise faulting in the pages costs more than everything else a command does. The file
// may still change size under a writer that ignores the lock, so it is read to its end
// whatever fstat said.
std::string ReadFile(int fd, std::size_t expected, TknCtl::Lib::FileText& out) {
    constexpr std::size_t kHugePage = 2 * 1024 * 1024;
    if (expected > static_cast<std::size_t>(kMaxStateSize)) {
        return "too large (" + std::to_string(expected) + " bytes)";
    }
    std::size_t capacity = expected + 65536;
    char* block = nullptr;
    if (expected >= kHugePage / 2) {
        capacity = (capacity + kHugePage - 1) / kHugePage * kHugePage;
        block = static_cast<char*>(std::aligned_alloc(kHugePage, capacity));
        if (block) madvise(block, capacity, MADV_HUGEPAGE);
    } else {
        block = static_cast<char*>(std::malloc(capacity));
    }
    if (!block) return "too large to read into memory";
    out.block.reset(block);
    std::size_t used = 0;
    while (true) {
        if (used == capacity) {
            if (capacity > static_cast<std::size_t>(kMaxStateSize)) return "too large";
            std::size_t larger = capacity * 2;
            char* grown = static_cast<char*>(std::realloc(out.block.get(), larger));
            if (!grown) return "too large to read into memory";
            out.block.release();
            out.block.reset(grown);
            capacity = larger;
        }
        ssize_t n = read(fd, out.block.get() + used, capacity - used);
        if (n < 0) {
            if (errno == EINTR) continue;
            return "cannot read: " + ErrnoText(errno);
        }
        if (n == 0) break;
        used += static_cast<std::size_t>(n);
    }
    if (used > static_cast<std::size_t>(kMaxStateSize))
        return "too large (" + std::to_string(used) + " bytes)";
    out.size = used;
    return {};
}

// Why a file that is not a regular file cannot be the state file.
std::string NotRegular(mode_t mode) {
    const char* kind = S_ISDIR(mode)    ? "a directory"
                       : S_ISFIFO(mode) ? "a FIFO"
                       : S_ISSOCK(mode) ? "a socket"
                       : S_ISCHR(mode)  ? "a character device"
                       : S_ISBLK(mode)  ? "a block device"
                                        : "of an unknown type";
    return std::string("not a regular file (it is ") + kind + ")";
}

// The file a state path names: the path itself, or the end of the chain of symbolic links
// it starts (a relative link leads from the directory the link is in). A link that leads
// nowhere is refused: the state would be created somewhere the user did not mean.
std::string LinkTarget(const std::string& path) {
    constexpr int kMaxLinks = 40;  // as the system follows them
    std::string current = path;
    for (int links = 0;; ++links) {
        struct stat info {};
        if (lstat(current.c_str(), &info) != 0) {
            if (links > 0 && (errno == ENOENT || errno == ENOTDIR)) {
                Fail(path, "a symbolic link to " + current + ", which does not exist");
            }
            return current;  // missing, or a fault the open reports
        }
        if (!S_ISLNK(info.st_mode)) return current;
        if (links == kMaxLinks) Fail(path, "too many levels of symbolic links");
        std::string link(static_cast<std::size_t>(info.st_size > 0 ? info.st_size : 255) + 1, '\0');
        while (true) {
            ssize_t length = readlink(current.c_str(), link.data(), link.size());
            if (length < 0) Fail(path, "cannot read the symbolic link " + current + ": " + ErrnoText(errno));
            if (static_cast<std::size_t>(length) < link.size()) {
                link.resize(static_cast<std::size_t>(length));
                break;
            }
            link.resize(link.size() * 2);  // it grew since lstat
        }
        if (link.empty()) Fail(path, "the symbolic link " + current + " is empty");
        current = link[0] == '/' ? link : DirectoryOf(current) + "/" + link;
    }
}

}  // namespace

std::string ResolveStatePath(const std::string& given) {
    if (!given.empty()) return given;
    if (const char* env = std::getenv("HADRO_STATE"); env && *env) return env;
    std::string base;
    if (const char* xdg = std::getenv("XDG_STATE_HOME"); xdg && xdg[0] == '/') {
        base = xdg;
    } else {
        std::string home;
        if (const char* env = std::getenv("HOME"); env && *env) {
            home = env;
        } else if (const passwd* entry = getpwuid(getuid()); entry && entry->pw_dir && *entry->pw_dir) {
            home = entry->pw_dir;
        } else {
            throw StateFileError(
                "no state file: there is no home directory; give --state or set HADRO_STATE");
        }
        base = home + "/.local/state";
    }
    return base + "/hadro/host.json";
}

struct HostSession::Impl {
    std::unique_ptr<Store> store;                     // the simulated host
    std::unique_ptr<TknCtl::Backend::Host> realHost;  // a real host
    std::string path;                                 // as given; empty in memory
    std::string target;                               // the file path names, through its symbolic links
    int lockFd = -1;
    bool mustWrite = false;  // the file does not exist yet
    bool existed = false;
    mode_t mode = 0600;
    std::unique_ptr<DryRunLog> dryRun;  // set once the session is a dry run

    ~Impl() {
        if (lockFd >= 0) close(lockFd);  // releases the lock
    }

    void WriteFile(const std::vector<std::string_view>& pieces);
};

HostSession::HostSession(std::unique_ptr<Impl> impl) : impl_(std::move(impl)) {
    if (g_current) throw HostCtlException("a host session is already open");
    g_current = this;
    g_store = impl_->store.get();
    g_realHost = impl_->realHost.get();
}

HostSession::~HostSession() {
    if (g_current == this) {
        g_current = nullptr;
        g_store = nullptr;
        g_realHost = nullptr;
        g_dryRun = nullptr;
    }
}

HostSession* HostSession::Current() {
    return g_current;
}

std::string HostSession::DefaultDocument() {
    return std::string(reinterpret_cast<const char*>(TknCtl::Lib::kDefaultHost),
                       TknCtl::Lib::kDefaultHostSize);
}

void HostSession::ValidateDocument(const std::string& json, const std::string& origin) {
    Store store(json, origin);
    store.LoadAll();
}

std::unique_ptr<HostSession> HostSession::InMemory(const std::string& json) {
    if (g_current) throw HostCtlException("a host session is already open");
    auto impl = std::make_unique<Impl>();
    impl->store = std::make_unique<Store>(json, "in-memory state");
    return std::unique_ptr<HostSession>(new HostSession(std::move(impl)));
}

std::unique_ptr<HostSession> HostSession::InMemoryDefault() {
    auto session = InMemory(DefaultDocument());
    session->impl_->store->RewriteAll();
    session->impl_->store->Rebase(session->impl_->store->Export());
    return session;
}

std::unique_ptr<HostSession> HostSession::OpenLinux() {
    if (g_current) throw HostCtlException("a host session is already open");
    auto impl = std::make_unique<Impl>();
    impl->realHost = TknCtl::Backend::OpenLinuxHost();
    return std::unique_ptr<HostSession>(new HostSession(std::move(impl)));
}

std::unique_ptr<HostSession> HostSession::OpenFile(const std::string& path, OpenMode openMode) {
    if (g_current) throw HostCtlException("a host session is already open");
    if (path.empty()) throw StateFileError("no state file given");
    auto impl = std::make_unique<Impl>();
    impl->path = path;
    // A symbolic link stays: the file it leads to is locked, read and replaced.
    impl->target = LinkTarget(path);
    const std::string& target = impl->target;

    // Anything but a regular file is refused before anything is created or opened: opening a
    // FIFO waits for a writer, a device may do something of its own.
    struct stat info {};
    if (lstat(target.c_str(), &info) == 0 && !S_ISREG(info.st_mode)) Fail(path, NotRegular(info.st_mode));

    MakeDirectories(DirectoryOf(target), path);
    std::string lockPath = target + ".lock";
    impl->lockFd = open(lockPath.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0600);
    if (impl->lockFd < 0) Fail(path, "cannot open lock file " + lockPath + ": " + ErrnoText(errno));
    if (fstat(impl->lockFd, &info) != 0 || !S_ISREG(info.st_mode))
        Fail(path, "lock file " + lockPath + " is not a regular file");
    while (flock(impl->lockFd, LOCK_EX) != 0) {
        if (errno != EINTR) Fail(path, "cannot lock " + lockPath + ": " + ErrnoText(errno));
    }

    TknCtl::Lib::FileText text;
    if (openMode == OpenMode::kReplace) {
        // The document is not read: only the mode of the file it replaces is kept.
        if (lstat(target.c_str(), &info) == 0) {
            if (!S_ISREG(info.st_mode)) Fail(path, NotRegular(info.st_mode));
            impl->existed = true;
            impl->mode = info.st_mode & 0777;
        } else if (errno != ENOENT) {
            Fail(path, "cannot read: " + ErrnoText(errno));
        }
        impl->mustWrite = true;
    } else {
        // Not blocking and not through a link: what was checked above may have been
        // replaced since by something else.
        int fd = open(target.c_str(), O_RDONLY | O_NONBLOCK | O_NOFOLLOW | O_CLOEXEC);
        if (fd < 0) {
            if (errno != ENOENT) Fail(path, "cannot read: " + ErrnoText(errno));
            impl->mustWrite = true;
        } else {
            if (fstat(fd, &info) != 0) {
                int error = errno;
                close(fd);
                Fail(path, "cannot read: " + ErrnoText(error));
            }
            if (!S_ISREG(info.st_mode)) {
                close(fd);
                Fail(path, NotRegular(info.st_mode));
            }
            impl->existed = true;
            impl->mode = info.st_mode & 0777;
            std::string fault = ReadFile(fd, static_cast<std::size_t>(info.st_size), text);
            close(fd);
            if (!fault.empty()) Fail(path, fault);
        }
    }

    if (impl->mustWrite) {
        impl->store = std::make_unique<Store>(DefaultDocument(), Origin(path));
        impl->store->RewriteAll();
    } else {
        impl->store = std::make_unique<Store>(std::move(text), Origin(path));
        // A section edited outside the library (or damaged) may break what other sections
        // rely on: the whole document is checked now, before any command can act on it or
        // write it back.
        if (!impl->store->Verify()) impl->store->LoadAll();
    }
    return std::unique_ptr<HostSession>(new HostSession(std::move(impl)));
}

void HostSession::Impl::WriteFile(const std::vector<std::string_view>& pieces) {
    std::string dir = DirectoryOf(target);
    std::string base = BaseOf(target);
    std::string prefix = "." + base + ".tmp.";

    // Temporary files left by writers that were killed: we hold the lock, so no other
    // writer is at work and they can go.
    if (DIR* listing = opendir(dir.c_str())) {
        while (const dirent* entry = readdir(listing)) {
            if (std::strncmp(entry->d_name, prefix.c_str(), prefix.size()) == 0) {
                unlinkat(dirfd(listing), entry->d_name, 0);
            }
        }
        closedir(listing);
    }

    static std::atomic<unsigned> counter{0};
    std::string temp;
    int fd = -1;
    for (int attempt = 0; attempt < 100 && fd < 0; ++attempt) {
        auto stamp = std::chrono::steady_clock::now().time_since_epoch().count();
        temp = dir + "/" + prefix + std::to_string(getpid()) + "." + std::to_string(counter++) + "." +
               std::to_string(stamp % 1000000);
        fd = open(temp.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0600);
        if (fd < 0 && errno != EEXIST) break;
    }
    if (fd < 0)
        Fail(path, "cannot write: cannot create a temporary file in " + dir + ": " + ErrnoText(errno));

    auto abandon = [&](const std::string& step, int error) {
        close(fd);
        unlink(temp.c_str());
        Fail(path, "cannot write: " + step + ": " + ErrnoText(error));
    };
    if (existed && mode != 0600 && fchmod(fd, mode) != 0) abandon("cannot set the mode", errno);
    // The whole document in as few calls as the system takes (its sections are pieces of
    // the text that was read and of what was re-serialised), into space reserved at once.
    std::size_t total = 0;
    for (auto piece : pieces)
        total += piece.size();
    if (total > 0) static_cast<void>(fallocate(fd, 0, 0, static_cast<off_t>(total)));
    if (!WriteAll(fd, pieces)) abandon("write failed", errno);
    if (fsync(fd) != 0) abandon("fsync failed", errno);
    if (close(fd) != 0) {
        int error = errno;
        unlink(temp.c_str());
        Fail(path, "cannot write: close failed: " + ErrnoText(error));
    }
    if (rename(temp.c_str(), target.c_str()) != 0) {
        int error = errno;
        unlink(temp.c_str());
        Fail(path, "cannot write: rename failed: " + ErrnoText(error));
    }
    int dirFd = open(dir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (dirFd < 0) Fail(path, "written, but cannot open its directory to sync it: " + ErrnoText(errno));
    if (fsync(dirFd) != 0 && errno != EINVAL) {
        int error = errno;
        close(dirFd);
        Fail(path, "written, but syncing its directory failed: " + ErrnoText(error));
    }
    close(dirFd);
    existed = true;
}

void HostSession::Commit() {
    if (impl_->realHost) return impl_->realHost->Commit();
    // Each changed section is serialized once: for telling whether it really changed, and
    // then for writing.
    Store::Snapshot snapshot = impl_->store->TakeSnapshot();
    if (!impl_->mustWrite && !impl_->store->Differs(snapshot)) return;
    impl_->store->AddDigests(snapshot);
    // A dry run commits in memory only, as a session held in memory does: what a command
    // changed is seen by the next command of a batch, and never reaches the file.
    if (!impl_->path.empty() && !impl_->dryRun) impl_->WriteFile(snapshot.pieces);
    impl_->mustWrite = false;
    impl_->store->Committed(std::move(snapshot));
}

void HostSession::Rollback() {
    if (impl_->realHost) return impl_->realHost->Discard();
    impl_->store->Discard();
}

bool HostSession::HasChanges() const {
    if (impl_->realHost) return impl_->realHost->HasChanges();
    return impl_->mustWrite || impl_->store->HasChanges();
}

std::string HostSession::Export() const {
    if (impl_->realHost) NotOnRealHost("exporting");
    return impl_->store->Export();
}

void HostSession::Replace(const std::string& json, const std::string& origin) {
    if (impl_->realHost) NotOnRealHost("replacing the state");
    Store checked(json, origin);
    checked.LoadAll();
    checked.RewriteAll();
    impl_->store = std::make_unique<Store>(checked.Export(),
                                           impl_->path.empty() ? "in-memory state" : Origin(impl_->path));
    if (g_current == this) g_store = impl_->store.get();
    impl_->mustWrite = true;
}

void HostSession::Reset() {
    Replace(DefaultDocument(), "the default host");
}

void HostSession::StartDryRun() {
    if (impl_->dryRun) return;
    impl_->dryRun = std::make_unique<DryRunLog>();
    if (g_current == this) g_dryRun = impl_->dryRun.get();
    if (impl_->realHost) {
        DryRunLog* log = impl_->dryRun.get();
        impl_->realHost->StartDryRun([log](const std::string& line, bool last) { log->Record(line, last); });
    }
}

bool HostSession::IsDryRun() const {
    return impl_->dryRun != nullptr;
}

std::vector<std::string> HostSession::TakeDryRunLines() {
    std::vector<std::string> lines;
    if (!impl_->dryRun) return lines;
    lines.swap(impl_->dryRun->lines);
    impl_->dryRun->stopped = false;
    return lines;
}

const std::string& HostSession::GetPath() const {
    return impl_->path;
}

BackendKind HostSession::GetBackend() const {
    return impl_->realHost ? BackendKind::kLinux : BackendKind::kSimulated;
}

void HostSession::ConfirmWithin(unsigned seconds) {
    if (!impl_->realHost) throw HostCtlException("The simulated host keeps no checkpoints");
    impl_->realHost->ConfirmWithin(seconds);
}

void HostSession::BeginAtomic() {
    if (impl_->realHost) impl_->realHost->BeginAtomic();
}

void HostSession::EndAtomic(bool keep) {
    if (impl_->realHost) impl_->realHost->EndAtomic(keep);
}

void HostSession::ConfirmCheckpoint() {
    if (!impl_->realHost) throw HostCtlException("The simulated host keeps no checkpoints");
    impl_->realHost->ConfirmCheckpoint();
}

void HostSession::RollbackCheckpoint() {
    if (!impl_->realHost) throw HostCtlException("The simulated host keeps no checkpoints");
    impl_->realHost->RollbackCheckpoint();
}

}  // namespace HostCtl::Lib

namespace TknCtl::Lib {

Store& CurrentStore() {
    if (!HostCtl::Lib::g_store) {
        // An operation that has no counterpart on the real host reached for the model.
        if (HostCtl::Lib::g_realHost) {
            throw HostCtl::Lib::HostCtlException("This operation is not available on the " +
                                                 HostCtl::Lib::g_realHost->Describe());
        }
        throw HostCtl::Lib::HostCtlException("no host session is open");
    }
    return *HostCtl::Lib::g_store;
}

void RequireSession() {
    if (!HostCtl::Lib::g_current) throw HostCtl::Lib::HostCtlException("no host session is open");
}

Backend::Host* RealHost() {
    return HostCtl::Lib::g_realHost;
}

bool DryRun() {
    return HostCtl::Lib::g_dryRun != nullptr;
}

void RecordDryRun(std::string line, bool last) {
    if (auto* log = HostCtl::Lib::g_dryRun) log->Record(std::move(line), last);
}

}  // namespace TknCtl::Lib

#include "core/checkpoint.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <fstream>
#include <nlohmann/json.hpp>
#include <stdexcept>

#include "core/context.h"
#include "core/restore.h"
#include "hostctl/exception.h"
#include "hostctl/session.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;
using HostCtl::Lib::StateFileError;
using nlohmann::json;

namespace {

constexpr int kVersion = 1;
constexpr const char* kPendingFile = "pending.json";
constexpr const char* kSnapshotFile = "snapshot.json";
constexpr const char* kConfirm = "'hadrocli --backend=linux --confirm'";
constexpr const char* kRollback = "'hadrocli --backend=linux --rollback'";

std::int64_t BootMillis() {
    timespec now{};
    clock_gettime(CLOCK_BOOTTIME, &now);
    return static_cast<std::int64_t>(now.tv_sec) * 1000 + now.tv_nsec / 1000000;
}

std::string BootId() {
    std::ifstream in("/proc/sys/kernel/random/boot_id");
    std::string id;
    std::getline(in, id);
    return id;
}

// "2025-06-01 12:00:01", local time.
std::string TimeText(std::int64_t seconds) {
    std::time_t t = static_cast<std::time_t>(seconds);
    std::tm local{};
    localtime_r(&t, &local);
    char text[32];
    std::strftime(text, sizeof(text), "%Y-%m-%d %H:%M:%S", &local);
    return text;
}

[[noreturn]] void Damaged(const std::string& path, const std::string& fault) {
    throw StateFileError("Linux host checkpoint " + path + ": " + fault);
}

std::optional<std::string> ReadText(const std::string& path) {
    int fd = open(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOFOLLOW | O_CLOEXEC);
    if (fd < 0) {
        if (errno == ENOENT) return std::nullopt;
        Damaged(path, std::string("cannot read: ") + std::strerror(errno));
    }
    std::string text;
    char buffer[65536];
    while (true) {
        ssize_t n = read(fd, buffer, sizeof(buffer));
        if (n < 0 && errno == EINTR) continue;
        if (n < 0) {
            int error = errno;
            close(fd);
            Damaged(path, std::string("cannot read: ") + std::strerror(error));
        }
        if (n == 0) break;
        text.append(buffer, static_cast<std::size_t>(n));
    }
    close(fd);
    return text;
}

// Through a temporary file, fsync and rename, then the directory's fsync.
void WriteText(const std::string& directory, const std::string& name, const std::string& text, mode_t mode) {
    const std::string path = directory + "/" + name;
    const std::string temp = directory + "/." + name + ".tmp." + std::to_string(getpid());
    int fd = open(temp.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, mode);
    if (fd < 0) Damaged(path, "cannot write: " + temp + ": " + std::strerror(errno));
    bool ok = fchmod(fd, mode) == 0;
    for (std::size_t done = 0; ok && done < text.size();) {
        ssize_t n = write(fd, text.data() + done, text.size() - done);
        if (n < 0 && errno == EINTR) continue;
        ok = n > 0;
        if (ok) done += static_cast<std::size_t>(n);
    }
    ok = ok && fsync(fd) == 0;
    int error = errno;
    ok = close(fd) == 0 && ok;
    if (!ok || rename(temp.c_str(), path.c_str()) != 0) {
        if (ok) error = errno;
        unlink(temp.c_str());
        Damaged(path, std::string("cannot write: ") + std::strerror(error));
    }
    if (int dir = open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC); dir >= 0) {
        fsync(dir);
        close(dir);
    }
}

std::optional<PendingCheckpoint> ReadPendingIn(const std::string& directory) {
    const std::string path = directory + "/" + kPendingFile;
    auto text = ReadText(path);
    if (!text) return std::nullopt;
    try {
        return PendingFromJson(*text);
    } catch (const std::invalid_argument& e) {
        Damaged(path, e.what());
    }
}

void RemoveFilesIn(const std::string& directory) {
    for (const char* name : {kPendingFile, kSnapshotFile}) {
        const std::string path = directory + "/" + name;
        if (unlink(path.c_str()) != 0 && errno != ENOENT)
            Damaged(path, std::string("cannot remove: ") + std::strerror(errno));
    }
    rmdir(directory.c_str());
}

// Takes the document's lock. A damaged document is no reason to keep the host as it is: the
// lock is held all the same (Document::Lock takes it before it reads), and a restore writes the
// checkpoint's document over it.
void LockDocumentOf(Context& context) {
    try {
        context.GetDocument().Lock();
    } catch (const StateFileError&) {
        if (!context.GetDocument().IsLocked()) throw;
    }
}

void SleepMillis(std::int64_t millis) {
    timespec wait{static_cast<time_t>(millis / 1000), static_cast<long>(millis % 1000) * 1000000};
    while (nanosleep(&wait, &wait) != 0 && errno == EINTR) {
    }
}

// The watcher's life once it knows who it is: waits for the deadline of the checkpoint that
// names it, and restores it then; leaves as soon as the checkpoint is confirmed, restored by
// someone else, or not its own.
void WaitAndRestore(const Config& config, const std::string& directory, const ProcessIdentity& self) {
    while (true) {
        while (true) {
            std::optional<PendingCheckpoint> pending;
            try {
                pending = ReadPendingIn(directory);
            } catch (const StateFileError&) {
                return;  // reported as stale once the watcher is gone
            }
            if (!pending || !(pending->owner == self) || !pending->deadlineBoot) return;
            const std::int64_t left = *pending->deadlineBoot - BootMillis();
            if (left <= 0) break;
            SleepMillis(std::min<std::int64_t>(left, 1000));
        }
        Context context(config);
        LockDocumentOf(context);
        auto pending = ReadPendingIn(directory);
        if (!pending || !(pending->owner == self) || !pending->deadlineBoot) return;
        if (*pending->deadlineBoot > BootMillis()) continue;  // a change joined and put it off
        auto text = ReadText(directory + "/" + kSnapshotFile);
        if (!text) return;
        Restore(context, SnapshotFromJson(*text));
        RemoveFilesIn(directory);
        return;
    }
}

// The watcher: the grandchild of the command, in a session of its own. It tells the command its
// PID, then waits to be armed (a byte) or let go (the command closes its end without one: it
// made no change, unless it wrote a checkpoint naming the watcher before it died).
[[noreturn]] void Watch(int fd, const Config& config, const std::string& directory) {
    prctl(PR_SET_NAME, "hadro-watcher");
    signal(SIGHUP, SIG_IGN);
    signal(SIGINT, SIG_IGN);
    signal(SIGPIPE, SIG_IGN);
    int null = open("/dev/null", O_RDWR);
    if (null >= 0) {
        dup2(null, STDIN_FILENO);
        dup2(null, STDOUT_FILENO);
        dup2(null, STDERR_FILENO);
    }
    if (fd != 3) {
        if (dup2(fd, 3) < 0) _exit(1);
    }
    // Nothing of the command's stays open: its lock files, sockets, pipes.
    close_range(4, ~0U, 0);
    if (chdir("/") != 0) _exit(1);
    pid_t me = getpid();
    if (write(3, &me, sizeof(me)) != static_cast<ssize_t>(sizeof(me))) _exit(1);
    char armed = 0;
    while (read(3, &armed, 1) < 0 && errno == EINTR) {
    }
    close(3);
    try {
        if (auto self = ProcessIdentity::Of(me)) WaitAndRestore(config, directory, *self);
    } catch (...) {
        // What could not be restored stays pending, and is reported as such.
    }
    _exit(0);
}

}  // namespace

// ---------------------------------------------------------------- process identities

std::optional<ProcessIdentity> ProcessIdentity::Of(pid_t pid) {
    if (pid <= 0) return std::nullopt;
    std::ifstream in("/proc/" + std::to_string(pid) + "/stat");
    std::string line;
    if (!std::getline(in, line)) return std::nullopt;
    // After the command's name (in parentheses, which it may hold itself) come the fields from
    // the third on; the start time is the 22nd.
    auto close = line.rfind(')');
    if (close == std::string::npos) return std::nullopt;
    std::size_t at = close + 1;
    for (int field = 3; field <= 22; ++field) {
        at = line.find_first_not_of(' ', at);
        if (at == std::string::npos) return std::nullopt;
        std::size_t end = line.find(' ', at);
        // A process that ended and waits for its parent to hear of it is gone.
        if (field == 3 && (line[at] == 'Z' || line[at] == 'X')) return std::nullopt;
        if (field == 22) {
            ProcessIdentity identity;
            identity.pid = pid;
            try {
                identity.start = std::stoull(line.substr(at, end - at));
            } catch (const std::exception&) {
                return std::nullopt;
            }
            identity.boot = BootId();
            return identity;
        }
        at = end;
    }
    return std::nullopt;
}

bool ProcessIdentity::Alive() const {
    auto now = Of(pid);
    return now && *now == *this;
}

// ---------------------------------------------------------------- pending.json

std::string PendingToJson(const PendingCheckpoint& pending) {
    json out{{"version", kVersion},
             {"taken", pending.taken},
             {"deadline", pending.deadline ? json(*pending.deadline) : json()},
             {"deadlineBoot", pending.deadlineBoot ? json(*pending.deadlineBoot) : json()},
             {"owner",
              {{"pid", pending.owner.pid}, {"start", pending.owner.start}, {"boot", pending.owner.boot}}}};
    return out.dump(1) + "\n";
}

PendingCheckpoint PendingFromJson(std::string_view text) {
    json parsed = json::parse(text, nullptr, false);
    if (parsed.is_discarded() || !parsed.is_object()) throw std::invalid_argument("not a JSON object");
    auto member = [&](const json& object, const char* name) -> const json& {
        auto it = object.find(name);
        if (it == object.end()) throw std::invalid_argument(std::string("no \"") + name + "\"");
        return *it;
    };
    auto integer = [&](const json& value, const char* name) {
        if (!value.is_number_integer())
            throw std::invalid_argument(std::string("\"") + name + "\" is no integer");
        return value.get<std::int64_t>();
    };
    if (integer(member(parsed, "version"), "version") != kVersion)
        throw std::invalid_argument("not of version " + std::to_string(kVersion));
    for (const auto& [name, value] : parsed.items()) {
        if (name != "version" && name != "taken" && name != "deadline" && name != "deadlineBoot" &&
            name != "owner")
            throw std::invalid_argument("unknown member \"" + name + "\"");
    }
    PendingCheckpoint pending;
    pending.taken = integer(member(parsed, "taken"), "taken");
    for (auto [name, field] :
         {std::pair{"deadline", &pending.deadline}, {"deadlineBoot", &pending.deadlineBoot}}) {
        const json& value = member(parsed, name);
        if (!value.is_null()) *field = integer(value, name);
    }
    const json& owner = member(parsed, "owner");
    if (!owner.is_object()) throw std::invalid_argument("\"owner\" is no object");
    const std::int64_t pid = integer(member(owner, "pid"), "pid");
    const json& start = member(owner, "start");
    const json& boot = member(owner, "boot");
    if (pid <= 0 || pid > INT32_MAX) throw std::invalid_argument("\"pid\" is no process ID");
    if (!start.is_number_unsigned()) throw std::invalid_argument("\"start\" is no start time");
    if (!boot.is_string()) throw std::invalid_argument("\"boot\" is no boot ID");
    pending.owner.pid = static_cast<pid_t>(pid);
    pending.owner.start = start.get<std::uint64_t>();
    pending.owner.boot = boot.get<std::string>();
    return pending;
}

// ---------------------------------------------------------------- the session's checkpoints

struct Checkpoints::Watcher {
    ProcessIdentity identity;
    int fd = -1;  // our end of the pair: a byte arms it; closing it without one lets it go
    ~Watcher() {
        if (fd >= 0) close(fd);
    }
};

Checkpoints::Checkpoints(Context& context)
    : context_(context), directory_(DirectoryOf(context.GetDocument().Path())) {}

Checkpoints::~Checkpoints() = default;

std::string Checkpoints::DirectoryOf(const std::string& documentPath) {
    return documentPath + ".checkpoint";
}

std::optional<PendingCheckpoint> Checkpoints::ReadPending() const {
    return ReadPendingIn(directory_);
}

Snapshot Checkpoints::ReadSnapshot() const {
    const std::string path = directory_ + "/" + kSnapshotFile;
    auto text = ReadText(path);
    if (!text) Damaged(path, "missing");
    try {
        return SnapshotFromJson(*text);
    } catch (const std::invalid_argument& e) {
        Damaged(path, e.what());
    }
}

void Checkpoints::Write(const Snapshot& snapshot, const PendingCheckpoint& pending) const {
    if (mkdir(directory_.c_str(), 0755) != 0 && errno != EEXIST)
        Damaged(directory_, std::string("cannot make the directory: ") + std::strerror(errno));
    // Whatever the umask: every user's run reads pending.json, to say when nobody will restore it.
    chmod(directory_.c_str(), 0755);
    // The snapshot first: pending.json says there is one.
    WriteText(directory_, kSnapshotFile, SnapshotToJson(snapshot), 0600);
    WritePending(pending);
}

void Checkpoints::WritePending(const PendingCheckpoint& pending) const {
    WriteText(directory_, kPendingFile, PendingToJson(pending), 0644);
}

void Checkpoints::RemoveFiles() const {
    RemoveFilesIn(directory_);
}

void Checkpoints::LockDocument() {
    if (!Context::HasNetAdmin()) throw HostCtlException(Context::kNeedsRoot);
    LockDocumentOf(context_);
}

void Checkpoints::ConfirmWithin(unsigned seconds) {
    confirmWithin_ = seconds;
    if (watcher_) return;
    int pair[2];
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, pair) != 0)
        throw HostCtlException(std::string("Cannot start the checkpoint's watcher: ") + std::strerror(errno));
    const Config config = context_.GetConfig();
    pid_t child = fork();
    if (child < 0) {
        int error = errno;
        close(pair[0]);
        close(pair[1]);
        throw HostCtlException(std::string("Cannot start the checkpoint's watcher: ") + std::strerror(error));
    }
    if (child == 0) {
        // Out of the command's session and process group, then once more so that the watcher
        // leads no session and can never take a terminal.
        close(pair[0]);
        if (setsid() < 0) _exit(1);
        pid_t watcher = fork();
        if (watcher != 0) _exit(watcher < 0 ? 1 : 0);
        Watch(pair[1], config, directory_);
    }
    close(pair[1]);
    int status = 0;
    while (waitpid(child, &status, 0) < 0 && errno == EINTR) {
    }
    auto watcher = std::make_unique<Watcher>();
    watcher->fd = pair[0];
    pid_t pid = 0;
    pollfd wait{pair[0], POLLIN, 0};
    if (!WIFEXITED(status) || WEXITSTATUS(status) != 0 || poll(&wait, 1, 10000) != 1 ||
        read(pair[0], &pid, sizeof(pid)) != static_cast<ssize_t>(sizeof(pid)))
        throw HostCtlException("Cannot start the checkpoint's watcher: it did not start");
    auto identity = ProcessIdentity::Of(pid);
    if (!identity) throw HostCtlException("Cannot start the checkpoint's watcher: it ended at once");
    watcher->identity = *identity;
    watcher_ = std::move(watcher);
}

void Checkpoints::BeginAtomic() {
    atomic_ = true;
}

void Checkpoints::BeforeChange() {
    if (decided_) return;
    auto pending = ReadPending();
    if (pending) {
        if (!pending->owner.Alive()) {
            if (confirmWithin_) {
                throw HostCtlException("A checkpoint taken at " + TimeText(pending->taken) +
                                       " is pending and nothing will restore it (its watcher is gone): " +
                                       kConfirm + " keeps the changes made since, " + kRollback +
                                       " undoes them; either comes before a change with --confirm-within");
            }
        } else {
            std::string by;
            if (confirmWithin_ && pending->deadline && pending->deadlineBoot) {
                const std::int64_t boot = BootMillis() + std::int64_t{confirmWithin_} * 1000;
                if (boot > *pending->deadlineBoot) {
                    pending->deadlineBoot = boot;
                    pending->deadline = static_cast<std::int64_t>(std::time(nullptr)) + confirmWithin_;
                    WritePending(*pending);
                }
            }
            if (pending->deadline) by = " by " + TimeText(*pending->deadline);
            context_.Warn("this change joins the checkpoint taken at " + TimeText(pending->taken) +
                          ": unless " + kConfirm + " runs" + by + ", it is rolled back with it");
        }
        if (atomic_) batch_ = TakeSnapshot(context_);
        decided_ = true;
        return;
    }
    if (!confirmWithin_ && !atomic_) {
        decided_ = true;
        return;
    }
    if (confirmWithin_ && (!watcher_ || !watcher_->identity.Alive()))
        throw HostCtlException("Cannot take a checkpoint: its watcher is gone");

    Snapshot snapshot = TakeSnapshot(context_);
    PendingCheckpoint checkpoint;
    checkpoint.taken = snapshot.taken;
    if (confirmWithin_) {
        checkpoint.owner = watcher_->identity;
        checkpoint.deadline = snapshot.taken + confirmWithin_;
        checkpoint.deadlineBoot = BootMillis() + std::int64_t{confirmWithin_} * 1000;
    } else {
        auto self = ProcessIdentity::Of(getpid());
        if (!self) throw HostCtlException("Cannot take a checkpoint: this process cannot be told apart");
        checkpoint.owner = *self;
    }
    Write(snapshot, checkpoint);
    wrote_ = true;
    decided_ = true;
    if (atomic_) batch_ = std::move(snapshot);
    if (confirmWithin_) {
        // The checkpoint names the watcher: should the byte not reach it, it finds the file
        // when this process ends.
        const char armed = 'A';
        static_cast<void>(send(watcher_->fd, &armed, 1, MSG_NOSIGNAL));
    }
}

void Checkpoints::EndAtomic(bool keep) {
    if (!atomic_) return;
    atomic_ = false;
    if (keep) {
        if (wrote_ && !confirmWithin_) RemoveFiles();
        return;
    }
    if (!batch_) return;  // nothing was changed
    try {
        Restore(context_, *batch_);
    } catch (const HostCtlException& e) {
        throw HostCtlException(std::string(e.what()) + "; the batch's changes are not all undone" +
                               (wrote_ ? ": its checkpoint is kept for " + std::string(kRollback) : ""));
    }
    if (wrote_) {
        RemoveFiles();
        if (watcher_ && watcher_->identity.Alive()) kill(watcher_->identity.pid, SIGTERM);
    }
}

void Checkpoints::Confirm() {
    LockDocument();
    std::optional<PendingCheckpoint> pending;
    try {
        pending = ReadPending();
    } catch (const StateFileError&) {
        // Kept as the host is: a damaged checkpoint is no reason not to.
        RemoveFiles();
        return;
    }
    if (!pending) throw HostCtlException("No checkpoint is pending on this Linux host");
    RemoveFiles();
    if (pending->owner.Alive() && pending->owner.pid != getpid()) kill(pending->owner.pid, SIGTERM);
}

void Checkpoints::Rollback() {
    LockDocument();
    auto pending = ReadPending();
    if (!pending) throw HostCtlException("No checkpoint is pending on this Linux host");
    Snapshot snapshot = ReadSnapshot();
    try {
        Restore(context_, snapshot);
    } catch (const HostCtlException& e) {
        throw HostCtlException(std::string(e.what()) + "; the checkpoint is kept: " + kRollback +
                               " tries again, " + kConfirm + " keeps the host as it is");
    }
    RemoveFiles();
    if (pending->owner.Alive() && pending->owner.pid != getpid()) kill(pending->owner.pid, SIGTERM);
}

void Checkpoints::RequireUndoable(const std::string& what) {
    std::string when;
    if (confirmWithin_) {
        when = "with --confirm-within";
    } else if (atomic_) {
        when = "in an atomic batch";
    } else {
        bool pending = true;
        try {
            pending = ReadPending().has_value();
        } catch (const StateFileError&) {
        }
        if (!pending) return;
        when = "while a checkpoint is pending";
    }
    throw HostCtlException("This change cannot be rolled back, since a checkpoint does not hold " + what +
                           ": it is refused " + when);
}

void Checkpoints::ReportStale() {
    if (reported_) return;
    reported_ = true;
    std::optional<PendingCheckpoint> pending;
    try {
        pending = ReadPending();
    } catch (const StateFileError& e) {
        context_.Warn(std::string(e.what()) + ": " + kConfirm + " removes it");
        return;
    }
    if (!pending || pending->owner.Alive()) return;
    context_.Warn("a checkpoint taken at " + TimeText(pending->taken) +
                  " is pending and nothing will restore it (its watcher is gone): " + kConfirm +
                  " keeps the changes made since, " + kRollback + " undoes them");
}

}  // namespace TknCtl::Linux

// Checkpoints of the Linux host: changes that roll back by themselves.
//
// A checkpoint is a snapshot of the host (core/snapshot.h) taken before the first change of a
// command that asks for one, kept beside the host's document until it is confirmed or
// restored:
//
//     /var/lib/hadro/linux.json.checkpoint/    (the document's path + ".checkpoint", 0755)
//         pending.json    0644  that a checkpoint is pending: when it was taken, its deadline,
//                               and who restores it (the watcher: pid, start time, boot id)
//         snapshot.json   0600  the snapshot (the firewall's table and the xfrm policies are
//                               for root's eyes only); never a key: xfrm keys cannot be read
//
// Only one checkpoint is pending at a time; both files are written and removed under the
// document's lock (snapshot first, pending.json last; removed the other way round).
//
// --confirm-within=SECONDS (ConfirmWithin): before the session reads anything, a watcher is
// forked (twice, with a session of its own, no terminal, its standard files on /dev/null), so
// that it survives the command and its process group; it keeps nothing of the command's. At
// the first change the checkpoint is written naming it, and unless --confirm removes it in
// time the watcher restores it (core/restore.h) and removes it. A change made while a
// checkpoint is pending joins it: one line on stderr says so, and it is rolled back with it
// (with --confirm-within the deadline becomes the later of the two).
//
// An atomic batch (BeginAtomic, EndAtomic) takes a checkpoint the same way, owned by the batch's
// own process, and restores it at once when a line fails.
//
// A pending checkpoint whose owner is gone (killed; the machine restarted) is reported once by
// every session that reaches the host (ReportStale); --confirm and --rollback settle it.
#pragma once

#include <sys/types.h>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "core/snapshot.h"

namespace TknCtl::Linux {

class Context;

// A process, told apart from one that gets its PID later: its start time (clock ticks after
// boot, /proc/PID/stat) and the boot's ID (/proc/sys/kernel/random/boot_id).
struct ProcessIdentity {
    pid_t pid = 0;
    std::uint64_t start = 0;
    std::string boot;

    bool operator==(const ProcessIdentity&) const = default;
    // The identity of a running process; nothing when there is none of that PID.
    static std::optional<ProcessIdentity> Of(pid_t pid);
    // Whether the process still runs (the same PID, start time and boot).
    bool Alive() const;
};

// What pending.json holds.
struct PendingCheckpoint {
    std::int64_t taken = 0;                    // seconds since the epoch
    std::optional<std::int64_t> deadline;      // seconds since the epoch, for messages
    std::optional<std::int64_t> deadlineBoot;  // milliseconds since boot (CLOCK_BOOTTIME), for the watcher
    ProcessIdentity owner;                     // the watcher, or the atomic batch's process
};

std::string PendingToJson(const PendingCheckpoint& pending);
// Throws std::invalid_argument saying what is wrong.
PendingCheckpoint PendingFromJson(std::string_view text);

class Checkpoints {
public:
    explicit Checkpoints(Context& context);
    ~Checkpoints();
    Checkpoints(const Checkpoints&) = delete;
    Checkpoints& operator=(const Checkpoints&) = delete;

    // The directory of the checkpoint of a document.
    static std::string DirectoryOf(const std::string& documentPath);

    // The changes of this session roll back after seconds unless confirmed: forks the watcher.
    // Call it before the session reads the kernel. Throws HostCtlException when no watcher can
    // be started.
    void ConfirmWithin(unsigned seconds);
    void BeginAtomic();
    // keep: the batch succeeded. Otherwise its changes are undone at once; throws
    // HostCtlException when the host cannot be brought back (the checkpoint is then kept).
    void EndAtomic(bool keep);
    // --confirm, --rollback. Throw HostCtlException ("No checkpoint is pending ...", the refusal
    // without CAP_NET_ADMIN, what a rollback could not restore), StateFileError for damaged files.
    void Confirm();
    void Rollback();

    // Context::BeginChange, with the document locked: takes the checkpoint, joins the pending
    // one, or refuses a change with --confirm-within while a stale one is pending.
    void BeforeChange();
    // Refuses a change no checkpoint can take back (what: what a checkpoint does not hold)
    // while changes are to be rolled back.
    void RequireUndoable(const std::string& what);
    // One warning when a pending checkpoint has nobody left to restore it.
    void ReportStale();

private:
    struct Watcher;

    std::optional<PendingCheckpoint> ReadPending() const;
    Snapshot ReadSnapshot() const;
    void Write(const Snapshot& snapshot, const PendingCheckpoint& pending) const;
    void WritePending(const PendingCheckpoint& pending) const;
    void RemoveFiles() const;
    void LockDocument();

    Context& context_;
    std::string directory_;
    unsigned confirmWithin_ = 0;
    bool atomic_ = false;
    bool decided_ = false;  // BeforeChange has done its work in this session
    bool wrote_ = false;    // this session wrote the pending checkpoint
    bool reported_ = false;
    std::optional<Snapshot> batch_;  // what an atomic batch goes back to
    std::unique_ptr<Watcher> watcher_;
};

}  // namespace TknCtl::Linux

// Host sessions: one command line is one transaction on the host.
//
// A program opens a session before it runs a command and commits it afterwards: on the
// simulated host (the default), whose whole state lives in one file, or on the Linux machine
// the program runs on. Exactly one session is current at a time; the library's
// implementation objects reach the host through it and throw HostCtlException when none is
// open.
#pragma once

#include <exception>
#include <memory>
#include <string>
#include <vector>

namespace HostCtl::Lib {

// The state file cannot be used: it is unreadable, truncated, invalid, inconsistent, of
// another version, or it cannot be written. what() is one line that names the file and
// the fault. Deliberately not a HostCtlException: commands do not swallow it.
class StateFileError : public std::exception {
public:
    explicit StateFileError(std::string message);
    ~StateFileError() override;
    const char* what() const noexcept override { return message_.c_str(); }

private:
    std::string message_;
};

// A dry run that cannot go further: a step needs what an earlier step would have made (the
// namespace of a netstack it would create, say). The last line the dry run recorded says what
// the real run would do next; what() says it too. Deliberately not a HostCtlException: no
// command turns it into an error message, so that the program can end the dry run there.
class DryRunEnd : public std::exception {
public:
    explicit DryRunEnd(std::string next);
    ~DryRunEnd() override;
    const char* what() const noexcept override { return next_.c_str(); }

private:
    std::string next_;
};

// The state file to use: given when not empty, else $HADRO_STATE when set and not empty,
// else ${XDG_STATE_HOME:-$HOME/.local/state}/hadro/host.json. Throws StateFileError when
// no home directory can be found for the last case.
std::string ResolveStatePath(const std::string& given);

// The hosts a session can manage.
enum class BackendKind {
    kSimulated,  // the simulated host and its state file
    kLinux,      // the network of the Linux machine the program runs on
};

// The host named by given ("simulated" or "linux") when not empty, else by $HADRO_BACKEND
// when set and not empty, else the simulated host. Throws std::invalid_argument, whose
// message names the option or variable, the value and the choices, for any other name.
BackendKind ResolveBackend(const std::string& given);

class HostSession {
public:
    enum class OpenMode {
        kRead,     // use the document in the file
        kReplace,  // the caller replaces the whole document: the file is not read (so a
                   // damaged file can be reset), the session starts from the default host
    };

    // Opens the state file at path: takes an exclusive lock on "path.lock" (waiting for
    // other programs), then reads the document. A missing file starts from the default host
    // and is written by the first Commit. Throws StateFileError when the file cannot be
    // used; the file is then left as it is.
    static std::unique_ptr<HostSession> OpenFile(const std::string& path, OpenMode mode = OpenMode::kRead);
    // A session on a document held in memory only (tests, fixtures). Throws StateFileError
    // when the document is not acceptable.
    static std::unique_ptr<HostSession> InMemory(const std::string& json);
    // An in-memory session on the default host.
    static std::unique_ptr<HostSession> InMemoryDefault();
    // A session on the Linux machine this program runs on: the kernel is read at each call,
    // and what the kernel has no notion of is kept in the Linux host's own document. Throws
    // StateFileError when the Linux host cannot be used (its module, its configuration or its
    // document).
    static std::unique_ptr<HostSession> OpenLinux();

    // The current session, or nullptr.
    static HostSession* Current();
    // The default host document compiled into the library.
    static std::string DefaultDocument();
    // Checks a whole document (every section and every reference between sections) without
    // opening a session; throws StateFileError naming origin and the fault.
    static void ValidateDocument(const std::string& json, const std::string& origin);

    HostSession(const HostSession&) = delete;
    HostSession& operator=(const HostSession&) = delete;
    // Releases the lock without committing.
    ~HostSession();

    // Writes the document back when something changed (file sessions; in memory this only
    // makes the current state the committed one; on the Linux host its own document). Throws
    // StateFileError on failure; the old file then stays as it was.
    void Commit();
    // Forgets every change made since the session was opened or last committed.
    void Rollback();
    // True when Commit would write.
    bool HasChanges() const;
    // The current document as JSON text.
    std::string Export() const;
    // Replaces the whole document after checking it as ValidateDocument does; on failure
    // throws StateFileError and the session keeps its document.
    void Replace(const std::string& json, const std::string& origin);
    // Replaces the whole document by the default host.
    void Reset();
    // (Export, Replace and Reset concern the simulated host's document: on the Linux host
    // they throw StateFileError.)
    // Dry run: from now on the session changes nothing outside its own memory. Commit writes no
    // state file (on a real host no document, and its kernel requests are recorded instead of
    // made), so that the command's checks and the host's refusals run as for real. Every
    // host-control call is recorded as the journal records it, "OPERATION TARGET ARGUMENTS",
    // whether the journal is on or not (the journal itself is left alone); on a real host each
    // kernel request follows the call that made it, as "kernel: ..." (see the host's README).
    // A session does not leave its dry run.
    void StartDryRun();
    bool IsDryRun() const;
    // The lines recorded since the dry run started or since they were last taken; a dry run
    // that ended early (DryRunEnd) records again from here.
    std::vector<std::string> TakeDryRunLines();
    // The state file's path; empty for an in-memory session and on the Linux host.
    const std::string& GetPath() const;
    // Which host the session manages.
    BackendKind GetBackend() const;

    // Changes that roll back by themselves (the Linux host; see Backend::Host). A failure
    // throws HostCtlException with a message for the user (StateFileError when the checkpoint's
    // files cannot be used). The simulated host keeps every change of a session until Commit:
    // there BeginAtomic and EndAtomic do nothing and the others throw HostCtlException.
    void ConfirmWithin(unsigned seconds);
    void BeginAtomic();
    void EndAtomic(bool keep);
    void ConfirmCheckpoint();
    void RollbackCheckpoint();

    struct Impl;

private:
    explicit HostSession(std::unique_ptr<Impl> impl);
    std::unique_ptr<Impl> impl_;
};

}  // namespace HostCtl::Lib

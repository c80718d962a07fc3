// hadrocli: runs one command line of the host's administrative CLI.
#include <malloc.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iostream>
#include <memory>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

#include "hostctl/exception.h"
#include "hostctl/session.h"
#include "zorbel/checked_output.h"
#include "zorbel/dispatcher.h"
#include "zorbel/formatter.h"

namespace {

using Zorbel::AutoCli::Dispatcher;
using Zorbel::AutoCli::GlobalOptions;

// Standard output: std::cout writes through it. Made by main once the heap is prepared, and
// never destroyed, so that std::cout can still be flushed at exit.
Zorbel::Output::CheckedOutput* g_stdout = nullptr;
bool g_writeErrorReported = false;

// True when standard output could not be written; says so on stderr the first time, as the
// core utilities do. Whatever was committed before stays committed.
bool WriteFailed() {
    if (g_stdout->Error() == 0) return false;
    if (!g_writeErrorReported) {
        std::cerr << "Error: write error: " << std::strerror(g_stdout->Error()) << '\n';
        g_writeErrorReported = true;
    }
    return true;
}

// The exit status once every output is written: an unexpected failure (3) when it could not be.
int Finished(int status) {
    g_stdout->Finish();
    return WriteFailed() ? Zorbel::AutoCli::EXIT_UNEXPECTED : status;
}

// A command on a large host allocates tens of megabytes in small blocks (the state file, its
// parsed sections, one record per row, the rendered table). Faulting that memory in one 4 KiB
// page at a time costs more than the work itself where page faults are dear, as on virtual
// machines. So large blocks stay in the heap instead of mappings of their own, the heap keeps
// what it has grown to, and it is reserved in one step whose range the kernel may back with
// huge pages. The heap's free space then starts at the first huge page of that range (a filler
// block takes the space before it), so even a small command touches one huge page instead of
// dozens of small ones. Where huge pages are not available the advice is simply refused.
void PrepareHeap() {
    constexpr std::size_t kMiB = std::size_t{1} << 20;
    constexpr std::uintptr_t kHugePage = 2 * kMiB;
    constexpr std::uintptr_t kPage = 4096;
    constexpr std::size_t kProbe = kMiB;
    mallopt(M_MMAP_THRESHOLD, static_cast<int>(32 * kMiB));
    mallopt(M_TRIM_THRESHOLD, static_cast<int>(1024 * kMiB));
    mallopt(M_TOP_PAD, static_cast<int>(256 * kMiB));
    // More than the heap's free top: the heap grows by the pad now. The new top's header is
    // written just past the probe, so the advised range starts beyond that page: a huge page
    // cannot form where a small one is already in place.
    void* probe = std::malloc(kProbe);
    if (probe == nullptr) return;
    const auto at = reinterpret_cast<std::uintptr_t>(probe);
    const auto begin = (at + kProbe + 2 * kPage + kHugePage - 1) & ~(kHugePage - 1);
    const auto end = reinterpret_cast<std::uintptr_t>(sbrk(0)) & ~(kHugePage - 1);
    const bool advised = end > begin && begin - at <= 2 * kHugePage &&
                         madvise(reinterpret_cast<void*>(begin), end - begin, MADV_HUGEPAGE) == 0;
    std::free(probe);
    if (!advised) return;
    // The filler ends in the page before the advised range and stays allocated for the
    // process's life; what is allocated next starts there.
    [[maybe_unused]] static void* volatile filler;  // volatile: the block must really be allocated
    filler = std::malloc(begin - kPage - at);
}

bool IsDirectory(const std::string& path) {
    struct stat info {};
    return stat(path.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

std::string ExecutableDirectory() {
    char buffer[PATH_MAX];
    ssize_t length = readlink("/proc/self/exe", buffer, sizeof(buffer) - 1);
    if (length <= 0) return {};
    std::string path(buffer, static_cast<std::size_t>(length));
    auto slash = path.rfind('/');
    return slash == std::string::npos ? std::string() : path.substr(0, slash);
}

// --plugin-dir, else $HADRO_PLUGIN_PATH, else the installed plug-ins next to the program,
// else the build tree's.
std::vector<std::string> PluginDirectories(const GlobalOptions& options) {
    if (!options.pluginDirs.empty()) return options.pluginDirs;
    std::vector<std::string> dirs;
    if (const char* env = std::getenv("HADRO_PLUGIN_PATH"); env && *env) {
        std::string list = env;
        std::size_t start = 0;
        while (start <= list.size()) {
            std::size_t colon = list.find(':', start);
            if (colon == std::string::npos) colon = list.size();
            if (colon > start) dirs.push_back(list.substr(start, colon - start));
            start = colon + 1;
        }
        return dirs;
    }
    std::string installed = ExecutableDirectory() + "/../lib/hadro/plugins";
    if (IsDirectory(installed)) return {installed};
#ifdef HADRO_BUILD_PLUGIN_DIR
    if (IsDirectory(HADRO_BUILD_PLUGIN_DIR)) return {HADRO_BUILD_PLUGIN_DIR};
#endif
    return {installed};
}

// Opens the session on the host the options select: the simulated host's state file, or the
// Linux machine itself.
std::unique_ptr<HostCtl::Lib::HostSession> OpenSession(const GlobalOptions& options) {
    using HostCtl::Lib::HostSession;
    if (HostCtl::Lib::ResolveBackend(options.backend) == HostCtl::Lib::BackendKind::kLinux)
        return HostSession::OpenLinux();
    return HostSession::OpenFile(HostCtl::Lib::ResolveStatePath(options.statePath));
}

// Output held back until the state is written: a stream into a string that grows by what is
// written (a whole listing comes at once), with no buffer of its own to copy from.
class HeldOutput : public std::streambuf {
public:
    std::string text;

protected:
    std::streamsize xsputn(const char* data, std::streamsize count) override {
        text.append(data, static_cast<std::size_t>(count));
        return count;
    }
    int_type overflow(int_type c) override {
        if (!traits_type::eq_int_type(c, traits_type::eof())) text += traits_type::to_char_type(c);
        return traits_type::not_eof(c);
    }
};

// A command of a dry run (--dry-run) runs on a session that changes nothing: its checks and
// the host's refusals run as for real, its messages go to err as usual and its status is the
// one the real run would have as far as it can be known; its result is not shown (the calls
// it made are, by WriteDryRunLines). A dry run that went as far as it could (DryRunEnd: a step
// needs what an earlier one would have made) has found nothing wrong up to there: status 0.
int ExecuteDryRun(Dispatcher& dispatcher, const Zorbel::AutoCli::Invocation& invocation, std::ostream& err) {
    try {
        auto output = dispatcher.ExecuteRaw(invocation);
        for (const auto& message : output->GetErrorMessages())
            err << Zorbel::Format::TerminalSafeLines(message) << '\n';
        return Dispatcher::StatusOf(*output);
    } catch (const HostCtl::Lib::DryRunEnd&) {
        return Zorbel::AutoCli::EXIT_OK;
    } catch (const std::exception& e) {
        err << "Error: unexpected failure in '" << invocation.path
            << "': " << Zorbel::Format::TerminalSafeLines(e.what()) << '\n';
    } catch (...) {
        err << "Error: unexpected failure in '" << invocation.path << "'\n";
    }
    return Zorbel::AutoCli::EXIT_UNEXPECTED;
}

// The command of a command line: for real, or as a dry run.
int ExecuteCommand(Dispatcher& dispatcher, const Zorbel::AutoCli::Invocation& invocation,
                   const GlobalOptions& options, std::ostream& out, std::ostream& err) {
    if (options.dryRun) return ExecuteDryRun(dispatcher, invocation, err);
    return dispatcher.Execute(invocation, options, out, err);
}

// What a dry run recorded since last asked, one line each (the host's names escaped, as in
// every output).
void WriteDryRunLines(HostCtl::Lib::HostSession& session, std::ostream& out) {
    for (const auto& line : session.TakeDryRunLines())
        out << Zorbel::Format::TerminalSafe(line) << '\n';
}

// --confirm-within and --atomic: the session's changes roll back by themselves (unless
// confirmed) / when the batch fails. False, with one line on stderr, when the host cannot see to
// it (its watcher cannot be started): then nothing runs.
bool GuardChanges(HostCtl::Lib::HostSession& session, const GlobalOptions& options) {
    try {
        if (options.confirmWithin) session.ConfirmWithin(options.confirmWithin);
        if (options.atomic && !options.dryRun) session.BeginAtomic();
        return true;
    } catch (const HostCtl::Lib::HostCtlException& e) {
        std::cerr << "Error: " << Zorbel::Format::TerminalSafe(e.what()) << '\n';
        return false;
    }
}

// Runs the command as one transaction on the host state: the session is opened only now
// that a command is really going to run (help, listings and refusals never touch the
// state), and committed when the command ran to its end (status 0 or 1). An exception that
// escaped the command (status 3) discards its changes. The command's output is held back
// until the state is safely written, so that a failed write is never reported as success.
// A dry run commits nothing but the session's memory, and shows the calls instead of the result.
int RunInSession(Dispatcher& dispatcher, const Zorbel::AutoCli::Invocation& invocation,
                 const GlobalOptions& options) {
    using HostCtl::Lib::HostSession;
    using HostCtl::Lib::StateFileError;
    HeldOutput heldOut;
    HeldOutput heldErr;
    std::ostream out(&heldOut);
    std::ostream err(&heldErr);
    int status = Zorbel::AutoCli::EXIT_UNEXPECTED;
    std::unique_ptr<HostSession> session;
    try {
        session = OpenSession(options);
        if (!GuardChanges(*session, options)) return Zorbel::AutoCli::EXIT_UNEXPECTED;
        if (options.dryRun) session->StartDryRun();
        dispatcher.KeepLastResult(true);
        status = ExecuteCommand(dispatcher, invocation, options, out, err);
        if (status == Zorbel::AutoCli::EXIT_OK || status == Zorbel::AutoCli::EXIT_FAILED) session->Commit();
        if (options.dryRun) WriteDryRunLines(*session, out);
    } catch (const StateFileError& e) {
        std::cerr << "Error: " << e.what() << '\n';
        return Zorbel::AutoCli::EXIT_UNEXPECTED;
    }
    std::cout << heldOut.text;
    std::cerr << heldErr.text;
#ifndef HADRO_SANITIZE_BUILD
    // The process ends with this command: the host state it read and the result it built are
    // left to the system to reclaim at once rather than taken apart value by value. (The
    // sanitizer build takes them apart, so that its leak check sees everything.)
    std::_Exit(Finished(status));
#else
    return status;
#endif
}

// Splits one line of a batch into words, as a POSIX shell does for plain words: blanks
// separate words; '...' keeps everything literally; "..." keeps blanks and takes a backslash
// before " or \ as escaping it; elsewhere a backslash makes the next character literal; '#'
// at the start of a word begins a comment that runs to the end of the line. Returns false
// and sets error for a quote that is not closed or a backslash that ends the line.
bool SplitBatchLine(const std::string& line, std::vector<std::string>& words, std::string& error) {
    words.clear();
    std::string word;
    bool inWord = false;
    for (std::size_t i = 0; i < line.size(); ++i) {
        char c = line[i];
        if (c == ' ' || c == '\t' || c == '\r') {
            if (inWord) words.push_back(std::move(word));
            word.clear();
            inWord = false;
        } else if (c == '#' && !inWord) {
            break;
        } else if (c == '\\') {
            if (i + 1 >= line.size()) {
                error = "the line ends with a backslash";
                return false;
            }
            word += line[++i];
            inWord = true;
        } else if (c == '\'') {
            std::size_t close = line.find('\'', i + 1);
            if (close == std::string::npos) {
                error = "a single quote is not closed";
                return false;
            }
            word.append(line, i + 1, close - i - 1);
            i = close;
            inWord = true;
        } else if (c == '"') {
            ++i;
            while (i < line.size() && line[i] != '"') {
                if (line[i] == '\\' && i + 1 < line.size() && (line[i + 1] == '"' || line[i + 1] == '\\'))
                    ++i;
                word += line[i++];
            }
            if (i >= line.size()) {
                error = "a double quote is not closed";
                return false;
            }
            inWord = true;
        } else {
            word += c;
            inWord = true;
        }
    }
    if (inWord) words.push_back(std::move(word));
    return true;
}

// An atomic batch that does not succeed: a real host takes back the kernel changes of its
// earlier lines (the simulated host never wrote them). False, with the reason on stderr, when
// the host could not be brought back.
bool UndoBatch(HostCtl::Lib::HostSession* session) {
    if (!session) return true;
    try {
        session->EndAtomic(false);
        return true;
    } catch (const std::exception& e) {
        std::cerr << "Error: " << Zorbel::Format::TerminalSafe(e.what()) << '\n';
        return false;
    }
}

// Runs the command lines of a batch (a file, or standard input for "-") in one process and
// one session. Each line is what would follow hadrocli's global options; a line may set its
// own --formatter and --format-param. Without --atomic every line is a transaction of its
// own, as if hadrocli ran it (the state is written after a line only when it changed
// something), and the batch goes on after a failure. With --atomic the batch is one
// transaction: it stops at the first line that does not succeed, writes nothing, prints
// nothing on stdout, and the state is written once at the end when every line succeeded.
// A failing line is reported on stderr as "line N: TEXT" after its own messages. The exit
// status is 0 when every line succeeded, else that of the first failing line. With --dry-run
// every line is a dry run (a line may not say so itself): the session commits in memory only,
// so that a line sees what the lines before it would have changed, and each line's output is
// the calls it made.
int RunBatch(Dispatcher& dispatcher, const GlobalOptions& options) {
    using HostCtl::Lib::HostSession;
    using HostCtl::Lib::StateFileError;
    std::ifstream file;
    std::istream* input = &std::cin;
    const bool interactive = options.batch == "-";
    if (!interactive) {
        file.open(options.batch, std::ios::binary);
        if (!file) {
            std::cerr << "Error: batch file " << Zorbel::Format::TerminalSafe(options.batch)
                      << ": cannot read: " << std::strerror(errno) << '\n';
            return Zorbel::AutoCli::EXIT_UNEXPECTED;
        }
        input = &file;
    }

    std::unique_ptr<HostSession> session;
    std::string heldOut;  // --atomic: everything waits for the commit
    std::string heldErr;
    int first = Zorbel::AutoCli::EXIT_OK;
    std::string line;
    std::vector<std::string> words;
    std::ostringstream out;
    std::ostringstream err;
    for (std::size_t number = 1; std::getline(*input, line); ++number) {
        out.str({});
        err.str({});
        int status = Zorbel::AutoCli::EXIT_OK;
        std::string error;
        GlobalOptions own;
        std::vector<std::string> rest;
        if (!SplitBatchLine(line, words, error)) {
            err << "Error: " << error << '\n';
            status = Zorbel::AutoCli::EXIT_REFUSED;
        } else if (words.empty()) {
            continue;  // blank or a comment
        } else if (!Zorbel::AutoCli::ParseGlobalOptions(words, own, rest, error)) {
            err << "Error: " << error << '\n';
            status = Zorbel::AutoCli::EXIT_REFUSED;
        } else if (!own.statePath.empty() || !own.pluginDirs.empty() || !own.batch.empty() || own.atomic ||
                   !own.backend.empty() || own.dryRun || own.confirmWithin || own.confirm || own.rollback) {
            err << "Error: only --formatter and --format-param may stand before the words of a batch line\n";
            status = Zorbel::AutoCli::EXIT_REFUSED;
        } else {
            GlobalOptions lineOptions = own;
            lineOptions.statePath = options.statePath;
            lineOptions.backend = options.backend;
            lineOptions.pluginDirs = options.pluginDirs;
            lineOptions.dryRun = options.dryRun;
            if (!own.formatterGiven) {
                lineOptions.formatter = options.formatter;
                lineOptions.formatterGiven = options.formatterGiven;
            }
            lineOptions.formatParameters = options.formatParameters;
            lineOptions.formatParameters.insert(lineOptions.formatParameters.end(),
                                                own.formatParameters.begin(), own.formatParameters.end());
            auto prepared = dispatcher.Prepare(rest, lineOptions, out, err);
            status = prepared.status;
            if (prepared.ready) {
                try {
                    if (!session) {
                        session = OpenSession(options);
                        if (!GuardChanges(*session, options)) {
                            std::cerr << "line " << number << ": " << Zorbel::Format::TerminalSafe(line)
                                      << '\n';
                            return Zorbel::AutoCli::EXIT_UNEXPECTED;
                        }
                        if (options.dryRun) session->StartDryRun();
                    }
                    status = ExecuteCommand(dispatcher, prepared.invocation, lineOptions, out, err);
                    if (!options.atomic) {
                        // As for a single command line: a command that ran to its end is
                        // committed, one that ended in an unexpected failure leaves nothing.
                        if (status == Zorbel::AutoCli::EXIT_OK || status == Zorbel::AutoCli::EXIT_FAILED) {
                            session->Commit();
                        } else {
                            session->Rollback();
                        }
                    }
                    // The line's calls, after the line's own output (a dry run has none).
                    if (options.dryRun) WriteDryRunLines(*session, out);
                } catch (const StateFileError& e) {
                    // The state cannot be used: no later line could run either.
                    std::cerr << "Error: " << e.what() << '\n'
                              << "line " << number << ": " << Zorbel::Format::TerminalSafe(line) << '\n';
                    if (options.atomic) UndoBatch(session.get());
                    return Zorbel::AutoCli::EXIT_UNEXPECTED;
                }
            }
        }
        if (status != Zorbel::AutoCli::EXIT_OK) {
            err << "line " << number << ": " << Zorbel::Format::TerminalSafe(line) << '\n';
            if (options.atomic) {
                // Nothing of the batch took effect: its output would describe changes that
                // never happened. The session closes without writing, and a real host takes
                // back what the earlier lines changed.
                std::cerr << err.str();
                return UndoBatch(session.get()) ? status : Zorbel::AutoCli::EXIT_UNEXPECTED;
            }
            if (first == Zorbel::AutoCli::EXIT_OK) first = status;
        }
        if (options.atomic) {
            heldOut += out.str();
            heldErr += err.str();
        } else {
            std::cout << out.str();
            std::cerr << err.str();
            if (interactive) std::cout.flush();
            // Output that cannot be delivered is lost for every later line too.
            if (WriteFailed()) return Zorbel::AutoCli::EXIT_UNEXPECTED;
        }
    }
    if (input->bad()) {
        std::cerr << "Error: batch "
                  << (interactive ? "from standard input" : Zorbel::Format::TerminalSafe(options.batch))
                  << ": cannot read\n";
        if (options.atomic) UndoBatch(session.get());
        return Zorbel::AutoCli::EXIT_UNEXPECTED;
    }
    if (options.atomic && session) {
        try {
            session->Commit();
        } catch (const StateFileError& e) {
            std::cerr << "Error: " << e.what() << '\n';
            UndoBatch(session.get());
            return Zorbel::AutoCli::EXIT_UNEXPECTED;
        }
        try {
            session->EndAtomic(true);
        } catch (const std::exception& e) {
            // The batch is committed; only its checkpoint could not be dropped.
            std::cerr << "Error: " << Zorbel::Format::TerminalSafe(e.what()) << '\n';
            std::cout << heldOut;
            return Zorbel::AutoCli::EXIT_UNEXPECTED;
        }
    }
    std::cout << heldOut;
    std::cerr << heldErr;
    return first;
}

// --confirm and --rollback: the pending checkpoint of the Linux host is kept or restored; no
// command runs.
int SettleCheckpoint(const GlobalOptions& options) {
    try {
        auto session = OpenSession(options);
        if (options.confirm) {
            session->ConfirmCheckpoint();
        } else {
            session->RollbackCheckpoint();
        }
    } catch (const HostCtl::Lib::StateFileError& e) {
        std::cerr << "Error: " << e.what() << '\n';
        return Zorbel::AutoCli::EXIT_UNEXPECTED;
    } catch (const HostCtl::Lib::HostCtlException& e) {
        std::cerr << "Error: " << Zorbel::Format::TerminalSafe(e.what()) << '\n';
        return Zorbel::AutoCli::EXIT_FAILED;
    }
    return Zorbel::AutoCli::EXIT_OK;
}

int Main(int argc, char** argv) {
    std::vector<std::string> args(argv + 1, argv + argc);
    GlobalOptions options;
    std::vector<std::string> rest;
    std::string error;
    if (!Zorbel::AutoCli::ParseGlobalOptions(args, options, rest, error)) {
        std::cerr << "Error: " << error
                  << "\nUsage: hadrocli [global options] NAMESPACE... COMMAND [options]; "
                  << "see 'hadrocli --help'.\n";
        return Zorbel::AutoCli::EXIT_REFUSED;
    }

    const char* settle = options.confirm ? "--confirm" : options.rollback ? "--rollback" : nullptr;
    try {
        const bool onLinux =
            HostCtl::Lib::ResolveBackend(options.backend) == HostCtl::Lib::BackendKind::kLinux;
        if (onLinux && !options.statePath.empty()) {
            error =
                "option --state names the simulated host's state file; it does not go with --backend=linux";
        } else if (!onLinux && (options.confirmWithin || settle)) {
            error = std::string("option ") + (settle ? settle : "--confirm-within") +
                    " is for the Linux host (--backend=linux): the simulated host keeps no checkpoints";
        } else if (options.dryRun && (options.confirmWithin || settle)) {
            error = std::string("option --dry-run changes nothing: it cannot be combined with ") +
                    (settle ? settle : "--confirm-within");
        } else if (options.confirm && options.rollback) {
            error = "options --confirm and --rollback cannot be combined";
        } else if (settle && (options.confirmWithin || !options.batch.empty() || options.atomic ||
                              options.help || options.version || options.listCommands ||
                              !options.manual.empty() || !options.completion.empty())) {
            error = std::string("option ") + settle +
                    " cannot be combined with --confirm-within, --batch, --atomic, --help, --version, "
                    "--list-commands, --manual or --completion";
        } else if (settle && !rest.empty()) {
            error = std::string("option ") + settle + " runs no command; '" +
                    Zorbel::Format::TerminalSafe(rest.front()) + "' cannot follow it";
        }
    } catch (const std::invalid_argument& e) {
        error = Zorbel::Format::TerminalSafe(e.what());
    }
    if (!error.empty()) {
        std::cerr << "Error: " << error
                  << "\nUsage: hadrocli [global options] NAMESPACE... COMMAND [options]; "
                  << "see 'hadrocli --help'.\n";
        return Zorbel::AutoCli::EXIT_REFUSED;
    }

    if (options.atomic && options.batch.empty()) error = "option --atomic needs --batch";
    if (!options.batch.empty() && (options.help || options.version || options.listCommands)) {
        error = "option --batch cannot be combined with --help, --version or --list-commands";
    }
    if (!options.batch.empty() && !rest.empty()) {
        error = "option --batch takes its command lines from the batch; '" +
                Zorbel::Format::TerminalSafe(rest.front()) + "' cannot follow it";
    }
    if (!error.empty()) {
        std::cerr << "Error: " << error
                  << "\nUsage: hadrocli [global options] --batch FILE|-; see 'hadrocli --help'.\n";
        return Zorbel::AutoCli::EXIT_REFUSED;
    }

    if (settle) return SettleCheckpoint(options);

    auto dispatcher = Dispatcher::New("hadrocli");
    dispatcher->LoadPluginDirectories(PluginDirectories(options), std::cerr);
    if (!options.batch.empty()) return RunBatch(*dispatcher, options);

    auto prepared = dispatcher->Prepare(rest, options, std::cout, std::cerr);
    if (!prepared.ready) return prepared.status;
    return RunInSession(*dispatcher, prepared.invocation, options);
}

}  // namespace

int main(int argc, char** argv) {
    PrepareHeap();
    Zorbel::Output::ReserveStandardDescriptors();
    std::ios::sync_with_stdio(false);
    g_stdout = new Zorbel::Output::CheckedOutput(STDOUT_FILENO);
    std::cout.rdbuf(g_stdout);
    try {
        return Finished(Main(argc, argv));
    } catch (const std::exception& e) {
        std::cerr << "Error: unexpected failure: " << Zorbel::Format::TerminalSafeLines(e.what()) << '\n';
    } catch (...) {
        std::cerr << "Error: unexpected failure\n";
    }
    return Finished(Zorbel::AutoCli::EXIT_UNEXPECTED);
}

// The framework's runtime: owns the command tree, loads plug-ins, and turns one command line
// into a run of one command (or into help, a listing or a refusal) with its rendered result.
#pragma once

#include <functional>
#include <iosfwd>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "zorbel/autocli.h"

namespace Zorbel::AutoCli {

// Exit statuses of a command line.
enum ExitStatus : int {
    EXIT_OK = 0,
    EXIT_FAILED = 1,      // the command reported an error or returned false
    EXIT_REFUSED = 2,     // the command line was refused; nothing ran
    EXIT_UNEXPECTED = 3,  // an unexpected failure
};

// The options that stand before the first word of a command line.
struct GlobalOptions {
    std::string formatter;  // empty: the command's default, else "simple"
    bool formatterGiven = false;
    std::string backend;    // --backend: the host to manage (checked by the program); empty: not given
    std::string statePath;  // empty: not given
    std::vector<std::string> pluginDirs;
    bool listCommands = false;
    bool help = false;
    bool version = false;
    std::string batch;    // --batch FILE ("-": standard input); empty: not given
    bool atomic = false;  // --atomic: the whole batch is one transaction
    bool dryRun = false;  // --dry-run: the command changes nothing and lists the calls it would make
    std::vector<std::pair<std::string, std::string>> formatParameters;
    std::string manual;      // --manual ("man") or --manual=markdown; empty: not asked
    std::string completion;  // --completion=bash|zsh; empty: not asked
    // Changes that roll back by themselves (a host that keeps checkpoints: the Linux host).
    unsigned confirmWithin = 0;  // --confirm-within=SECONDS (1 to kMaxConfirmWithin); 0: not given
    bool confirm = false;        // --confirm: keep the changes of the pending checkpoint
    bool rollback = false;       // --rollback: restore the pending checkpoint now
};

// The longest wait --confirm-within takes: a day.
constexpr unsigned kMaxConfirmWithin = 86400;

// Splits argv (without the program name) into global options and the rest (words and
// command options). Returns false and sets error when a global option is malformed.
bool ParseGlobalOptions(const std::vector<std::string>& args, GlobalOptions& options,
                        std::vector<std::string>& rest, std::string& error);

// One command line resolved to a command, with its input checked and ready to run.
struct Invocation {
    std::shared_ptr<Command> command;
    std::string path;  // "network ip interface list"
    std::shared_ptr<CallSpec::InputSpec> inputSpec;
    std::shared_ptr<CallSpec::Input> input;
};

// The outcome of reading a command line: either finished (help, a listing, a refusal) with
// an exit status, or an invocation to run.
struct Prepared {
    bool ready = false;
    int status = EXIT_OK;
    Invocation invocation;
};

class Dispatcher : public std::enable_shared_from_this<Dispatcher> {
public:
    static std::shared_ptr<Dispatcher> New(std::string programName = "hadrocli");
    explicit Dispatcher(std::string programName);

    std::shared_ptr<NamespaceNode> GetRoot() const { return root_; }
    const std::string& GetProgramName() const { return programName_; }

    // Loads every "*.so" file of each directory (in name order) and lets it register its
    // namespaces. Failures are written to err, one line each; the other plug-ins still load.
    // Returns the number of plug-ins loaded.
    int LoadPluginDirectories(const std::vector<std::string>& dirs, std::ostream& err);
    // Loads one plug-in; on failure returns false and sets error.
    bool LoadPlugin(const std::string& path, std::string& error);

    // Resolves words and checks command options. Help, listings and refusals are written
    // to out/err here and come back finished.
    Prepared Prepare(const std::vector<std::string>& args, const GlobalOptions& options, std::ostream& out,
                     std::ostream& err);
    // Runs a prepared invocation and renders its result. An exception that escapes the
    // command is reported on err with EXIT_UNEXPECTED.
    int Execute(const Invocation& invocation, const GlobalOptions& options, std::ostream& out,
                std::ostream& err);
    // Runs the command and returns its output without rendering it; exceptions propagate.
    std::shared_ptr<CallSpec::Output> ExecuteRaw(const Invocation& invocation);
    // Prepare and Execute together.
    int Run(const std::vector<std::string>& args, const GlobalOptions& options, std::ostream& out,
            std::ostream& err);

    // Every command in tree order: path and command.
    std::vector<std::pair<std::string, std::shared_ptr<Command>>> ListCommands() const;
    // Writes --list-commands output.
    void WriteCommandList(const GlobalOptions& options, std::ostream& out) const;
    // Writes the program's own usage (no words given).
    void WriteUsage(std::ostream& out) const;

    // The exit status an output stands for (0, or 1 with errors or a false boolean root).
    static int StatusOf(const CallSpec::Output& output);

    // A program that ends right after its command need not take the result apart value by
    // value (a long listing holds tens of thousands): with keep set, Execute holds on to its
    // last result until the next Execute or the dispatcher's end.
    void KeepLastResult(bool keep) { keepLast_ = keep; }

private:
    std::string programName_;
    std::shared_ptr<NamespaceNode> root_;
    bool keepLast_ = false;
    std::shared_ptr<CallSpec::Output> last_;
};

}  // namespace Zorbel::AutoCli

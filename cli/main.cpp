// hadrocli: runs one command line of the host's administrative CLI.
#include <sys/stat.h>
#include <unistd.h>

#include <climits>
#include <cstdlib>
#include <iostream>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "hostctl/session.h"
#include "zorbel/dispatcher.h"
#include "zorbel/formatter.h"

namespace {

using Zorbel::AutoCli::Dispatcher;
using Zorbel::AutoCli::GlobalOptions;

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

// Runs the command as one transaction on the host state: the session is opened only now
// that a command is really going to run (help, listings and refusals never touch the
// state), and committed when the command ran to its end (status 0 or 1). An exception that
// escaped the command (status 3) discards its changes. The command's output is held back
// until the state is safely written, so that a failed write is never reported as success.
int RunInSession(Dispatcher& dispatcher, const Zorbel::AutoCli::Invocation& invocation,
                 const GlobalOptions& options) {
    using HostCtl::Lib::HostSession;
    using HostCtl::Lib::StateFileError;
    std::ostringstream out;
    std::ostringstream err;
    int status = Zorbel::AutoCli::EXIT_UNEXPECTED;
    try {
        auto session = HostSession::OpenFile(HostCtl::Lib::ResolveStatePath(options.statePath));
        status = dispatcher.Execute(invocation, options, out, err);
        if (status == Zorbel::AutoCli::EXIT_OK || status == Zorbel::AutoCli::EXIT_FAILED) session->Commit();
    } catch (const StateFileError& e) {
        std::cerr << "Error: " << e.what() << '\n';
        return Zorbel::AutoCli::EXIT_UNEXPECTED;
    }
    std::cout << out.str();
    std::cerr << err.str();
    return status;
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

    auto dispatcher = Dispatcher::New("hadrocli");
    dispatcher->LoadPluginDirectories(PluginDirectories(options), std::cerr);

    auto prepared = dispatcher->Prepare(rest, options, std::cout, std::cerr);
    if (!prepared.ready) return prepared.status;
    return RunInSession(*dispatcher, prepared.invocation, options);
}

}  // namespace

int main(int argc, char** argv) {
    std::ios::sync_with_stdio(false);
    try {
        int status = Main(argc, argv);
        std::cout.flush();
        return status;
    } catch (const std::exception& e) {
        std::cerr << "Error: unexpected failure: " << Zorbel::Format::TerminalSafeLines(e.what()) << '\n';
    } catch (...) {
        std::cerr << "Error: unexpected failure\n";
    }
    return Zorbel::AutoCli::EXIT_UNEXPECTED;
}

// libFuzzer target: whole command lines of the network plug-in, run in-process on an
// in-memory default host (parsing, checking, the command and the host-control library
// behind it, the formatters). Arguments are separated by NUL bytes. Whatever the command
// line, the status is 0, 1 or 2, and a refused one (2) leaves the host as it was.
#include <cstddef>
#include <cstdint>
#include <sstream>
#include <string>
#include <vector>

#include "hostctl/session.h"
#include "zorbel/dispatcher.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace Zorbel::AutoCli;
    using HostCtl::Lib::HostSession;
    static std::shared_ptr<Dispatcher> dispatcher = [] {
        auto d = Dispatcher::New("hadrocli");
        std::ostringstream ignored;
        d->LoadPluginDirectories({HADRO_PLUGIN_DIR}, ignored);
        return d;
    }();
    // The default host in the form a state file holds it; each input starts from it
    // (sections are parsed only when a command touches them).
    static const std::string host = [] {
        auto session = HostSession::InMemoryDefault();
        return session->Export();
    }();

    std::vector<std::string> args;
    std::string current;
    for (std::size_t i = 0; i < size; ++i) {
        if (data[i] == 0) {
            args.push_back(current);
            current.clear();
        } else {
            current += static_cast<char>(data[i]);
        }
    }
    args.push_back(current);

    GlobalOptions options;
    std::vector<std::string> rest;
    std::string error;
    if (!ParseGlobalOptions(args, options, rest, error)) return 0;
    auto session = HostSession::InMemory(host);
    std::ostringstream out, err;
    int status = dispatcher->Run(rest, options, out, err);
    if (status < 0 || status > 2) __builtin_trap();
    if (status == EXIT_REFUSED && session->HasChanges()) __builtin_trap();
    return 0;
}

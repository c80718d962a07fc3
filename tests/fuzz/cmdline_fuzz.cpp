// libFuzzer target: arbitrary command lines through global-option parsing, path resolution,
// option checking, help and the test commands. Arguments are separated by NUL bytes.
#include <cstddef>
#include <cstdint>
#include <sstream>
#include <string>
#include <vector>

#include "zorbel/dispatcher.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace Zorbel::AutoCli;
    static std::shared_ptr<Dispatcher> dispatcher = [] {
        auto d = Dispatcher::New("hadrocli");
        std::ostringstream ignored;
        d->LoadPluginDirectories({TEST_PLUGIN_DIR}, ignored);
        return d;
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
    std::ostringstream out, err;
    int status = dispatcher->Run(rest, options, out, err);
    if (status < 0 || status > 3) __builtin_trap();
    return 0;
}

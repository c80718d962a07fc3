#include "hostctl/util.h"

#include <iostream>

#include "backend/host.h"
#include "core/hook.h"

namespace TknCtl::Util {

int TknCtl_Exec(const std::string& command, bool, bool, bool) {
    if (Lib::TryEnter("TknCtl::Util::TknCtl_Exec", {}, command)) return 1;
    // A real host runs no program on the library's behalf (the Linux host changes the kernel
    // through its interfaces, never through programs), and has none of the daemons a command
    // may ask to restart: nothing needs restarting there, which is said.
    if (auto* host = Lib::RealHost())
        std::cerr << "Warning: \"" << command << "\" is not run: the " << host->Describe()
                  << " has no such daemon, and runs no programs\n";
    return 0;
}

}  // namespace TknCtl::Util

// Utilities of the host-control library.
#pragma once

#include <string>

namespace TknCtl::Util {

// Runs a command line on the host. The simulated host runs nothing: the command line is
// recorded in the journal (when it is on) and 0 is returned, or non-zero when a fault is
// injected for "TknCtl::Util::TknCtl_Exec". The flags are accepted for compatibility
// (wait for the command, discard its output, run in the background). A real host (the Linux
// host) runs nothing either: it has none of the daemons such a command line restarts; it
// says on stderr that the command line is not run and returns 0.
int TknCtl_Exec(const std::string& command, bool background, bool wait, bool discardOutput);

}  // namespace TknCtl::Util

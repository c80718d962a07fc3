// Opening real hosts.
#pragma once

#include <memory>

#include "backend/host.h"

namespace TknCtl::Backend {

// Loads the Linux host's module (once) and opens the host: its configuration and its own
// document are read. Throws HostCtl::Lib::StateFileError when the module cannot be loaded or
// the host cannot be used (a malformed configuration, a damaged document).
std::unique_ptr<Host> OpenLinuxHost();

}  // namespace TknCtl::Backend

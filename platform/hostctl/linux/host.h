// The Linux host: the network of the machine the program runs on.
#pragma once

#include <memory>

#include "backend/host.h"

namespace TknCtl::Linux {

// Opens the host: reads its configuration ($HADRO_LINUX_CONF, else /etc/hadro/linux.conf).
// Throws HostCtl::Lib::StateFileError when the configuration is malformed.
std::unique_ptr<Backend::Host> OpenHost();

}  // namespace TknCtl::Linux

// Kernel settings of a namespace under /proc/sys/net (sysctls): read and written as text, the
// file opened inside the namespace whose settings it holds.
#pragma once

#include <optional>
#include <string>

#include "kernel/netlink.h"

namespace TknCtl::Linux::Kernel {

// The value of the setting ("ipv4/tcp_congestion_control", "ipv6/conf/eth0/accept_ra"),
// without its final newline; nothing when the namespace does not have the setting. Throws
// HostCtlException when it cannot be read.
std::optional<std::string> ReadSysctl(const Namespace& ns, const std::string& name);
// Writes the setting; throws HostCtlException naming it and the kernel's refusal (an
// algorithm the namespace does not allow, a value out of range).
void WriteSysctl(const Namespace& ns, const std::string& name, const std::string& value);

}  // namespace TknCtl::Linux::Kernel

// Processes as /proc shows them: their names, and which of them hold a socket open (the owners
// that `ss -p` shows) or a device file (the process a device is handed to). A process whose
// descriptors the program may not read is not seen.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>

namespace TknCtl::Linux::Kernel {

struct Process {
    std::uint32_t pid = 0;
    std::string name;  // its comm, as ps and ss show it
};

// The inode of a socket from what a /proc/PID/fd link points to ("socket:[1234]"); 0 for
// anything else.
std::uint64_t SocketInodeOfLink(std::string_view target);

// The name of a process; nothing when it is gone or cannot be read.
std::optional<std::string> ProcessName(std::uint32_t pid, const std::string& procRoot = "/proc");

// The owners of sockets: each inode of the set that an open descriptor of a process holds,
// with the process of the lowest PID that holds it. Processes are looked at in PID order and
// the search ends once every inode has its owner.
std::map<std::uint64_t, Process> SocketOwners(const std::set<std::uint64_t>& inodes,
                                              const std::string& procRoot = "/proc");

// The holders of files: each path of the set that an open descriptor of a process points to
// (as /proc/PID/fd shows it), with the process of the lowest PID that holds it. Processes are
// looked at in PID order and the search ends once every path has its holder.
std::map<std::string, Process> FileHolders(const std::set<std::string>& paths,
                                           const std::string& procRoot = "/proc");

}  // namespace TknCtl::Linux::Kernel

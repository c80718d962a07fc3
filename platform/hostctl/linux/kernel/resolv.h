// Resolver configuration files (resolv.conf): parsed and written as plain text, keeping every
// line they do not concern.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace TknCtl::Linux::Kernel {

struct ResolverConfig {
    std::vector<std::string> servers;        // "nameserver" lines, in order
    std::vector<std::string> searchDomains;  // the last "search" (or "domain") line
};

ResolverConfig ParseResolvConf(std::string_view text);
// The text with its name servers and search domains replaced: the first "nameserver" line
// and the "search" line keep their places (new ones go at the end), every other line stays.
std::string UpdateResolvConf(std::string_view text, const ResolverConfig& config);

// The resolv.conf of a netstack: /etc/resolv.conf for the default, /etc/netns/NAME/resolv.conf
// for a named namespace (the convention of `ip netns exec`).
std::string ResolvConfPath(const std::string& namespaceName);

// The resolver daemon that manages the file, when it is a link into a daemon's run directory
// ("systemd-resolved", "resolvconf", "NetworkManager", ...); empty otherwise.
std::string ResolvConfManager(const std::string& path);

// Reads the file; a missing file is empty. Throws HostCtlException when it cannot be read.
std::string ReadResolvConf(const std::string& path);
// Replaces the file's content (through a temporary file and a rename; in place where the file
// is a mount point, as a bind-mounted resolv.conf is). A link is followed: its target is
// written and the link kept. Creates the directory of a netstack's file. Throws
// HostCtlException when it cannot be written.
void WriteResolvConf(const std::string& path, const std::string& text);

}  // namespace TknCtl::Linux::Kernel

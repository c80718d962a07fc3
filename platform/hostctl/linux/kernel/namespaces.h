// Named network namespaces, as `ip netns` keeps them: a namespace stays alive while its nsfs
// file is bind-mounted on /run/netns/NAME, and /run/netns is a shared mount point, so that
// unbinding a namespace in one mount namespace unbinds it in the others. Its files for
// `ip netns exec` (resolv.conf, ...) lie in /etc/netns/NAME.
#pragma once

#include <string>

namespace TknCtl::Linux::Kernel {

// Where the files of a named namespace lie for `ip netns exec`.
constexpr const char* kNamespaceFiles = "/etc/netns";

// Whether the text can name a namespace file: 1 to 255 bytes, no '/' or NUL, not "." or "..".
bool IsNamespaceName(const std::string& name);

// Whether /run/netns/NAME exists (whatever the program may do with it).
bool NamedNamespaceExists(const std::string& name);

// Makes a new network namespace and binds it on /run/netns/NAME (making /run/netns a shared
// mount point first, as `ip netns add` does). The calling thread stays in the namespace it
// was in. Throws HostCtlException naming the step the kernel refused; nothing is left behind
// then. A namespace of that name that exists is refused.
void AddNamedNamespace(const std::string& name);

// Unbinds /run/netns/NAME and removes the file (as `ip netns delete`): the namespace goes
// with its virtual interfaces once no process is in it. The netlink sockets the program made
// inside it are closed first. Throws HostCtlException when it cannot be unbound.
void DeleteNamedNamespace(const std::string& name);

// /etc/netns/NAME, made for a new namespace; true when it is there afterwards.
bool MakeNamespaceFiles(const std::string& name);
// Removes /etc/netns/NAME when it holds nothing but a resolv.conf (the namespace's resolver
// configuration goes with it); true when it is gone or was never there, false when it holds
// other files and is kept.
bool RemoveNamespaceFiles(const std::string& name);

}  // namespace TknCtl::Linux::Kernel

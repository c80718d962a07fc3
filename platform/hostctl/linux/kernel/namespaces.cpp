#include "kernel/namespaces.h"

#include <dirent.h>
#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <vector>

#include "hostctl/exception.h"
#include "kernel/dryrun.h"
#include "kernel/links.h"
#include "kernel/netlink.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

std::string PathOf(const std::string& name) {
    if (!IsNamespaceName(name)) throw HostCtlException("Invalid network namespace name '" + name + "'");
    return std::string(kNamedNamespaces) + "/" + name;
}

std::string Failure(const std::string& what, int error) {
    return what + ": " + std::strerror(error);
}

// /run/netns, made a shared mount point (a bind mount on itself where it is none yet).
void PrepareNamespaceDirectory() {
    if (mkdir(kNamedNamespaces, 0755) != 0 && errno != EEXIST)
        throw HostCtlException(Failure(std::string("cannot make ") + kNamedNamespaces, errno));
    bool bound = false;
    while (mount("", kNamedNamespaces, "none", MS_SHARED | MS_REC, nullptr) != 0) {
        if (errno != EINVAL || bound)
            throw HostCtlException(
                Failure(std::string("cannot make ") + kNamedNamespaces + " a shared mount", errno));
        if (mount(kNamedNamespaces, kNamedNamespaces, "none", MS_BIND | MS_REC, nullptr) != 0)
            throw HostCtlException(
                Failure(std::string("cannot bind ") + kNamedNamespaces + " on itself", errno));
        bound = true;
    }
}

}  // namespace

bool IsNamespaceName(const std::string& name) {
    return !name.empty() && name.size() <= 255 && name != "." && name != ".." &&
           name.find('/') == std::string::npos && name.find('\0') == std::string::npos;
}

bool NamedNamespaceExists(const std::string& name) {
    if (!IsNamespaceName(name)) return false;
    if (IsPlannedNamespace(name)) return true;
    struct stat info {};
    return lstat(PathOf(name).c_str(), &info) == 0;
}

void AddNamedNamespace(const std::string& name) {
    std::string path = PathOf(name);
    if (DryRun()) {
        if (NamedNamespaceExists(name))
            throw HostCtlException("network namespace " + name + " exists already");
        Record("namespace add " + name);
        PlanNamespace(name, true);
        Record("link set lo up", Namespace::Named(name));
        return;
    }
    PrepareNamespaceDirectory();
    int file = open(path.c_str(), O_RDONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0);
    if (file < 0) {
        if (errno == EEXIST) throw HostCtlException("network namespace " + name + " exists already");
        throw HostCtlException(Failure("cannot make " + path, errno));
    }
    close(file);

    // The calling thread makes the namespace, binds it, and comes back to its own.
    int own = open("/proc/thread-self/ns/net", O_RDONLY | O_CLOEXEC);
    if (own < 0) {
        int error = errno;
        unlink(path.c_str());
        throw HostCtlException(Failure("cannot open the program's network namespace", error));
    }
    std::string fault;
    if (unshare(CLONE_NEWNET) != 0) {
        fault = Failure("cannot make network namespace " + name, errno);
    } else {
        if (mount("/proc/thread-self/ns/net", path.c_str(), "none", MS_BIND, nullptr) != 0)
            fault = Failure("cannot bind network namespace " + name + " on " + path, errno);
        if (setns(own, CLONE_NEWNET) != 0) {
            // Without its own namespace the program must not go on changing anything.
            fault = Failure("cannot come back to the program's network namespace", errno);
            close(own);
            if (umount2(path.c_str(), MNT_DETACH) == 0 || errno == EINVAL) unlink(path.c_str());
            throw HostCtlException(fault);
        }
    }
    close(own);
    if (!fault.empty()) {
        unlink(path.c_str());
        throw HostCtlException(fault);
    }
    // A netstack reaches itself from the start, as the program's own does: its loopback is up.
    try {
        LinkChange up;
        up.up = true;
        ChangeLink(Namespace::Named(name), "lo", up);
    } catch (...) {
        DeleteNamedNamespace(name);
        throw;
    }
}

void DeleteNamedNamespace(const std::string& name) {
    std::string path = PathOf(name);
    if (DryRun()) {
        Record("namespace delete " + name);
        return PlanNamespace(name, false);
    }
    ForgetSockets(Namespace::Named(name));
    // EINVAL: a file left without its namespace; it goes all the same.
    if (umount2(path.c_str(), MNT_DETACH) != 0 && errno != EINVAL && errno != ENOENT)
        throw HostCtlException(Failure("cannot unbind network namespace " + name, errno));
    if (unlink(path.c_str()) != 0 && errno != ENOENT)
        throw HostCtlException(Failure("cannot remove " + path, errno));
}

bool MakeNamespaceFiles(const std::string& name) {
    if (!IsNamespaceName(name)) return false;
    if (DryRun()) {
        const std::string dir = std::string(kNamespaceFiles) + "/" + name;
        struct stat info {};
        if (stat(dir.c_str(), &info) != 0) Record("file mkdir " + dir);
        return true;
    }
    if (mkdir(kNamespaceFiles, 0755) != 0 && errno != EEXIST) return false;
    std::string dir = std::string(kNamespaceFiles) + "/" + name;
    return mkdir(dir.c_str(), 0755) == 0 || errno == EEXIST;
}

bool RemoveNamespaceFiles(const std::string& name) {
    if (!IsNamespaceName(name)) return true;
    std::string dir = std::string(kNamespaceFiles) + "/" + name;
    DIR* listing = opendir(dir.c_str());
    if (!listing) return errno == ENOENT || errno == ENOTDIR;
    std::vector<std::string> files;
    while (const dirent* entry = readdir(listing)) {
        std::string file = entry->d_name;
        if (file != "." && file != "..") files.push_back(file);
    }
    closedir(listing);
    for (const auto& file : files) {
        if (file != "resolv.conf") return false;
    }
    if (DryRun()) {
        Record("file remove " + dir + (files.empty() ? "" : " (with its resolv.conf)"));
        return true;
    }
    if (!files.empty() && unlink((dir + "/resolv.conf").c_str()) != 0) return false;
    return rmdir(dir.c_str()) == 0;
}

}  // namespace TknCtl::Linux::Kernel

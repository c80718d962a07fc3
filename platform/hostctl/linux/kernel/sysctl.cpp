#include "kernel/sysctl.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "hostctl/exception.h"
#include "kernel/describe.h"
#include "kernel/dryrun.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

std::string PathOf(const std::string& name) {
    if (name.empty() || name.find("..") != std::string::npos)
        throw HostCtlException("Invalid kernel setting " + name);
    return "/proc/sys/net/" + name;
}

// Opens the file inside the namespace: /proc/sys/net shows the namespace of the one that
// opens it, for as long as the file stays open.
int OpenIn(const Namespace& ns, const std::string& path, int flags) {
    int fd = -1;
    int error = 0;
    ns.Run([&] {
        fd = open(path.c_str(), flags | O_CLOEXEC);
        error = errno;
    });
    errno = error;
    return fd;
}

}  // namespace

std::optional<std::string> ReadSysctl(const Namespace& ns, const std::string& name) {
    if (DryRun()) {
        if (auto planned = PlannedSysctl(ns, name)) return planned;
    }
    std::string path = PathOf(name);
    int fd = OpenIn(ns, path, O_RDONLY);
    if (fd < 0) {
        if (errno == ENOENT) return std::nullopt;
        throw HostCtlException("Cannot read kernel setting net." + name + ": " + std::strerror(errno));
    }
    std::string text;
    char buffer[4096];
    while (true) {
        ssize_t n = read(fd, buffer, sizeof(buffer));
        if (n < 0 && errno == EINTR) continue;
        if (n < 0) {
            int error = errno;
            close(fd);
            throw HostCtlException("Cannot read kernel setting net." + name + ": " + std::strerror(error));
        }
        if (n == 0) break;
        text.append(buffer, static_cast<std::size_t>(n));
    }
    close(fd);
    while (!text.empty() && (text.back() == '\n' || text.back() == ' '))
        text.pop_back();
    return text;
}

void WriteSysctl(const Namespace& ns, const std::string& name, const std::string& value) {
    if (DryRun()) {
        Record(DescribeSysctl(name, value), ns);
        return PlanSysctl(ns, name, value);
    }
    std::string path = PathOf(name);
    int fd = OpenIn(ns, path, O_WRONLY);
    if (fd < 0)
        throw HostCtlException("Cannot change kernel setting net." + name + ": " + std::strerror(errno));
    std::string text = value + "\n";
    ssize_t n;
    do {
        n = write(fd, text.data(), text.size());
    } while (n < 0 && errno == EINTR);
    int error = errno;
    close(fd);
    if (n < 0)
        throw HostCtlException("Cannot set kernel setting net." + name + " to " + value + ": " +
                               std::strerror(error));
}

}  // namespace TknCtl::Linux::Kernel

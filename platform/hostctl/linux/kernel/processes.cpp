#include "kernel/processes.h"

#include <dirent.h>
#include <fcntl.h>
#include <limits.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <vector>

namespace TknCtl::Linux::Kernel {

namespace {

// The decimal number that is the whole text, or nothing.
template <class T>
std::optional<T> Number(std::string_view text) {
    T value{};
    if (text.empty()) return std::nullopt;
    auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
    return value;
}

std::vector<std::uint32_t> Pids(const std::string& procRoot) {
    std::vector<std::uint32_t> pids;
    if (DIR* dir = opendir(procRoot.c_str())) {
        while (const dirent* entry = readdir(dir)) {
            if (auto pid = Number<std::uint32_t>(entry->d_name); pid && *pid != 0) pids.push_back(*pid);
        }
        closedir(dir);
    }
    std::sort(pids.begin(), pids.end());
    return pids;
}

}  // namespace

std::uint64_t SocketInodeOfLink(std::string_view target) {
    constexpr std::string_view prefix = "socket:[";
    if (target.size() <= prefix.size() + 1 || target.substr(0, prefix.size()) != prefix ||
        target.back() != ']')
        return 0;
    return Number<std::uint64_t>(target.substr(prefix.size(), target.size() - prefix.size() - 1)).value_or(0);
}

std::optional<std::string> ProcessName(std::uint32_t pid, const std::string& procRoot) {
    if (pid == 0) return std::nullopt;
    std::string path = procRoot + "/" + std::to_string(pid) + "/comm";
    int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) return std::nullopt;
    char buffer[256];
    ssize_t n = read(fd, buffer, sizeof(buffer));
    close(fd);
    if (n < 0) return std::nullopt;
    std::string name(buffer, static_cast<std::size_t>(n));
    if (!name.empty() && name.back() == '\n') name.pop_back();
    return name;
}

std::map<std::uint64_t, Process> SocketOwners(const std::set<std::uint64_t>& inodes,
                                              const std::string& procRoot) {
    std::map<std::uint64_t, Process> owners;
    if (inodes.empty()) return owners;
    for (std::uint32_t pid : Pids(procRoot)) {
        std::string fds = procRoot + "/" + std::to_string(pid) + "/fd";
        DIR* dir = opendir(fds.c_str());
        if (!dir) continue;  // gone, or not ours to read
        bool found = false;
        while (const dirent* entry = readdir(dir)) {
            if (entry->d_name[0] == '.') continue;
            char target[64];
            ssize_t n = readlinkat(dirfd(dir), entry->d_name, target, sizeof(target));
            if (n <= 0 || static_cast<std::size_t>(n) >= sizeof(target)) continue;
            std::uint64_t inode = SocketInodeOfLink(std::string_view(target, static_cast<std::size_t>(n)));
            if (inode == 0 || !inodes.count(inode) || owners.count(inode)) continue;
            owners[inode].pid = pid;
            found = true;
        }
        closedir(dir);
        if (!found) continue;
        std::string name = ProcessName(pid, procRoot).value_or(std::string());
        for (auto& [inode, owner] : owners) {
            if (owner.pid == pid) owner.name = name;
        }
        if (owners.size() == inodes.size()) break;
    }
    return owners;
}

std::map<std::string, Process> FileHolders(const std::set<std::string>& paths, const std::string& procRoot) {
    std::map<std::string, Process> holders;
    if (paths.empty()) return holders;
    for (std::uint32_t pid : Pids(procRoot)) {
        std::string fds = procRoot + "/" + std::to_string(pid) + "/fd";
        DIR* dir = opendir(fds.c_str());
        if (!dir) continue;  // gone, or not ours to read
        bool found = false;
        while (const dirent* entry = readdir(dir)) {
            if (entry->d_name[0] == '.') continue;
            char target[PATH_MAX];
            ssize_t n = readlinkat(dirfd(dir), entry->d_name, target, sizeof(target));
            if (n <= 0 || static_cast<std::size_t>(n) >= sizeof(target)) continue;
            std::string path(target, static_cast<std::size_t>(n));
            if (!paths.count(path) || holders.count(path)) continue;
            holders[path].pid = pid;
            found = true;
        }
        closedir(dir);
        if (!found) continue;
        std::string name = ProcessName(pid, procRoot).value_or(std::string());
        for (auto& [path, holder] : holders) {
            if (holder.pid == pid) holder.name = name;
        }
        if (holders.size() == paths.size()) break;
    }
    return holders;
}

}  // namespace TknCtl::Linux::Kernel

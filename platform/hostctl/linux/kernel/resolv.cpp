#include "kernel/resolv.h"

#include <fcntl.h>
#include <limits.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <sstream>

#include "hostctl/exception.h"
#include "kernel/describe.h"
#include "kernel/dryrun.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

// The keyword of a line and its words, or an empty keyword for a comment or blank line.
std::vector<std::string> WordsOf(std::string_view line) {
    std::vector<std::string> words;
    std::istringstream in{std::string(line)};
    for (std::string word; in >> word;) {
        if (word[0] == '#' || word[0] == ';') break;
        words.push_back(word);
    }
    return words;
}

std::vector<std::string_view> Lines(std::string_view text) {
    std::vector<std::string_view> lines;
    std::size_t start = 0;
    while (start < text.size()) {
        std::size_t end = text.find('\n', start);
        if (end == std::string_view::npos) end = text.size();
        lines.push_back(text.substr(start, end - start));
        start = end + 1;
    }
    return lines;
}

std::string Errno(int error) {
    return std::strerror(error);
}

}  // namespace

ResolverConfig ParseResolvConf(std::string_view text) {
    ResolverConfig config;
    for (auto line : Lines(text)) {
        auto words = WordsOf(line);
        if (words.size() < 2) continue;
        if (words[0] == "nameserver") {
            config.servers.push_back(words[1]);
        } else if (words[0] == "search" || words[0] == "domain") {
            // The last of these lines is the one the resolver uses.
            config.searchDomains.assign(words.begin() + 1, words.end());
        }
    }
    return config;
}

std::string UpdateResolvConf(std::string_view text, const ResolverConfig& config) {
    std::string out;
    bool serversWritten = false;
    bool searchWritten = false;
    auto writeServers = [&] {
        for (const auto& server : config.servers)
            out += "nameserver " + server + "\n";
        serversWritten = true;
    };
    auto writeSearch = [&] {
        if (!config.searchDomains.empty()) {
            out += "search";
            for (const auto& domain : config.searchDomains)
                out += " " + domain;
            out += "\n";
        }
        searchWritten = true;
    };
    for (auto line : Lines(text)) {
        auto words = WordsOf(line);
        if (!words.empty() && words[0] == "nameserver") {
            if (!serversWritten) writeServers();
            continue;
        }
        if (!words.empty() && (words[0] == "search" || words[0] == "domain")) {
            if (!searchWritten) writeSearch();
            continue;
        }
        out.append(line);
        out += '\n';
    }
    if (!serversWritten) writeServers();
    if (!searchWritten) writeSearch();
    return out;
}

std::string ResolvConfPath(const std::string& namespaceName) {
    return namespaceName.empty() ? std::string("/etc/resolv.conf")
                                 : "/etc/netns/" + namespaceName + "/resolv.conf";
}

std::string ResolvConfManager(const std::string& path) {
    char target[PATH_MAX];
    ssize_t n = readlink(path.c_str(), target, sizeof(target) - 1);
    if (n <= 0) return {};
    std::string link(target, static_cast<std::size_t>(n));
    struct Known {
        const char* part;
        const char* manager;
    };
    static const Known known[] = {
        {"/systemd/resolve/", "systemd-resolved"},
        {"/resolvconf/", "resolvconf"},
        {"/NetworkManager/", "NetworkManager"},
        {"/connman/", "connman"},
        {"/netconfig/", "netconfig"},
    };
    for (const auto& entry : known) {
        if (link.find(entry.part) != std::string::npos) return entry.manager;
    }
    return {};
}

std::string ReadResolvConf(const std::string& path) {
    if (DryRun()) {
        // What a dry run would have written, at the file a link leads to.
        char* real = realpath(path.c_str(), nullptr);
        auto planned = PlannedFile(real ? std::string(real) : path);
        std::free(real);
        if (planned) return *planned;
    }
    int fd = open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    if (fd < 0) {
        if (errno == ENOENT) return {};
        throw HostCtlException("Cannot read " + path + ": " + Errno(errno));
    }
    struct stat info {};
    if (fstat(fd, &info) != 0 || !S_ISREG(info.st_mode)) {
        close(fd);
        throw HostCtlException("Cannot read " + path + ": not a regular file");
    }
    std::string text;
    char buffer[8192];
    while (true) {
        ssize_t n = read(fd, buffer, sizeof(buffer));
        if (n < 0 && errno == EINTR) continue;
        if (n < 0) {
            int error = errno;
            close(fd);
            throw HostCtlException("Cannot read " + path + ": " + Errno(error));
        }
        if (n == 0) break;
        text.append(buffer, static_cast<std::size_t>(n));
        if (text.size() > (1u << 20)) {
            close(fd);
            throw HostCtlException("Cannot read " + path + ": larger than a resolver configuration can be");
        }
    }
    close(fd);
    return text;
}

void WriteResolvConf(const std::string& given, const std::string& text) {
    std::string path = given;
    if (char* real = realpath(given.c_str(), nullptr)) {
        path = real;  // a link: its target is written, the link stays
        std::free(real);
    }
    if (DryRun()) {
        Record(DescribeResolvConf(path, text));
        return PlanFile(path, text);
    }
    auto slash = path.rfind('/');
    std::string dir = slash == 0 ? "/" : path.substr(0, slash);
    for (std::size_t at = 1; at <= dir.size(); ++at) {
        if (at < dir.size() && dir[at] != '/') continue;
        std::string part = dir.substr(0, at);
        if (access(part.c_str(), F_OK) != 0 && mkdir(part.c_str(), 0755) != 0 && errno != EEXIST)
            throw HostCtlException("Cannot write " + path + ": cannot create " + part + ": " + Errno(errno));
    }

    auto writeAll = [&](int fd) {
        std::size_t done = 0;
        while (done < text.size()) {
            ssize_t n = write(fd, text.data() + done, text.size() - done);
            if (n < 0 && errno == EINTR) continue;
            if (n < 0) return false;
            done += static_cast<std::size_t>(n);
        }
        return fsync(fd) == 0;
    };

    std::string temp = dir + "/.resolv.conf.hadro." + std::to_string(getpid());
    int fd = open(temp.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, 0644);
    if (fd < 0) throw HostCtlException("Cannot write " + path + ": " + Errno(errno));
    if (!writeAll(fd)) {
        int error = errno;
        close(fd);
        unlink(temp.c_str());
        throw HostCtlException("Cannot write " + path + ": " + Errno(error));
    }
    close(fd);
    if (rename(temp.c_str(), path.c_str()) == 0) return;
    int error = errno;
    unlink(temp.c_str());
    if (error != EBUSY && error != EXDEV)
        throw HostCtlException("Cannot write " + path + ": " + Errno(error));
    // A mount point (a resolv.conf bound into a container or namespace) cannot be replaced:
    // it is rewritten in place.
    fd = open(path.c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC);
    if (fd < 0) throw HostCtlException("Cannot write " + path + ": " + Errno(errno));
    bool written = writeAll(fd);
    error = errno;
    close(fd);
    if (!written) throw HostCtlException("Cannot write " + path + ": " + Errno(error));
}

}  // namespace TknCtl::Linux::Kernel

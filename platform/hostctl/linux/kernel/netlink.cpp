#include "kernel/netlink.h"

#include <fcntl.h>
#include <netlink/netlink.h>
#include <netlink/socket.h>
#include <sched.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <map>
#include <memory>
#include <utility>

#include "hostctl/exception.h"
#include "kernel/dryrun.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

// The program's own namespace, opened once so that a thread can always come back to it.
int OwnNamespaceFd() {
    static int fd = open("/proc/self/ns/net", O_RDONLY | O_CLOEXEC);
    if (fd < 0)
        throw HostCtlException(std::string("cannot open the program's network namespace: ") +
                               std::strerror(errno));
    return fd;
}

struct SocketDeleter {
    void operator()(nl_sock* sock) const { nl_socket_free(sock); }
};

std::map<std::pair<int, std::string>, std::unique_ptr<nl_sock, SocketDeleter>>& Sockets() {
    static std::map<std::pair<int, std::string>, std::unique_ptr<nl_sock, SocketDeleter>> sockets;
    return sockets;
}

}  // namespace

std::string Namespace::Path() const {
    return IsOwn() ? std::string("/proc/self/ns/net") : std::string(kNamedNamespaces) + "/" + name_;
}

void Namespace::Run(const std::function<void()>& fn) const {
    if (IsOwn()) return fn();
    if (IsPlannedNamespace(name_))
        StopDryRun("work inside netstack " + name_ + ", which this dry run does not make");
    int own = OwnNamespaceFd();
    int fd = open(Path().c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        throw HostCtlException("cannot open network namespace " + name_ + ": " + std::strerror(errno));
    }
    if (setns(fd, CLONE_NEWNET) != 0) {
        int error = errno;
        close(fd);
        throw HostCtlException("cannot enter network namespace " + name_ + ": " + std::strerror(error) +
                               (error == EPERM ? " (entering it needs CAP_SYS_ADMIN)" : ""));
    }
    close(fd);
    struct Back {
        int own;
        ~Back() {
            // Coming back cannot fail for a namespace the program was in.
            static_cast<void>(setns(own, CLONE_NEWNET));
        }
    } back{own};
    fn();
}

nl_sock* Socket(int protocol, const Namespace& ns) {
    auto key = std::make_pair(protocol, ns.Name());
    auto& sockets = Sockets();
    if (auto it = sockets.find(key); it != sockets.end()) return it->second.get();
    std::unique_ptr<nl_sock, SocketDeleter> sock(nl_socket_alloc());
    if (!sock) throw HostCtlException("cannot make a netlink socket: out of memory");
    ns.Run([&] {
        Check(nl_connect(sock.get(), protocol),
              "cannot open a netlink socket" + (ns.IsOwn() ? std::string() : " in namespace " + ns.Name()));
    });
    // Replies to dumps of large tables come in many parts; a larger buffer takes fewer reads.
    nl_socket_set_buffer_size(sock.get(), 1 << 20, 1 << 20);
    nl_sock* raw = sock.get();
    sockets.emplace(key, std::move(sock));
    return raw;
}

void ForgetSockets(const Namespace& ns) {
    auto& sockets = Sockets();
    for (auto it = sockets.begin(); it != sockets.end();) {
        if (it->first.second == ns.Name()) {
            it = sockets.erase(it);
        } else {
            ++it;
        }
    }
}

std::string ErrorText(int nlError) {
    return nl_geterror(nlError);
}

int Check(int nlError, const std::string& what) {
    if (nlError < 0) throw HostCtlException(what + ": " + ErrorText(nlError));
    return nlError;
}

}  // namespace TknCtl::Linux::Kernel

#include "kernel/sockets.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <linux/inet_diag.h>
#include <linux/netlink.h>
#include <linux/sock_diag.h>
#include <netinet/in.h>
#include <netlink/errno.h>
#include <netlink/msg.h>
#include <netlink/netlink.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <iterator>
#include <memory>

#include "hostctl/exception.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};
struct CallbackPut {
    void operator()(nl_cb* cb) const { nl_cb_put(cb); }
};

const char* KindName(SocketKind kind) {
    switch (kind) {
        case SocketKind::kTcp:
            return "TCP";
        case SocketKind::kUdp:
            return "UDP";
        case SocketKind::kRaw:
            return "raw IP";
    }
    return "";
}

std::string AddressText(int family, const __be32* words) {
    char text[INET6_ADDRSTRLEN] = {};
    if (!inet_ntop(family, words, text, sizeof(text))) return {};
    return text;
}

int Collect(nl_msg* message, void* arg) {
    if (auto socket = ParseSocket(message))
        static_cast<std::vector<InetSocket>*>(arg)->push_back(std::move(*socket));
    return NL_OK;
}

// The end of a dump carries the dump's own error (ENOENT: no diagnostics for that kind), which
// libnl leaves unread.
int Finish(nl_msg* message, void* arg) {
    nlmsghdr* header = nlmsg_hdr(message);
    if (nlmsg_datalen(header) >= static_cast<int>(sizeof(int))) {
        int error = 0;
        std::memcpy(&error, nlmsg_data(header), sizeof(error));
        if (error < 0) *static_cast<int*>(arg) = -error;
    }
    return NL_STOP;
}

const char* TableOf(SocketKind kind, int family) {
    bool six = family == AF_INET6;
    switch (kind) {
        case SocketKind::kTcp:
            return six ? "tcp6" : "tcp";
        case SocketKind::kUdp:
            return six ? "udp6" : "udp";
        case SocketKind::kRaw:
            break;
    }
    return six ? "raw6" : "raw";
}

// A hexadecimal number that is the whole text.
template <class T>
bool Hex(std::string_view text, T& value) {
    auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value, 16);
    return !text.empty() && error == std::errc() && end == text.data() + text.size();
}

// "0100007F:1F90": the address as the kernel's 32-bit words in hexadecimal, and the port.
bool Endpoint(std::string_view text, int family, std::string& address, std::uint16_t& port) {
    std::size_t words = family == AF_INET6 ? 4 : 1;
    auto colon = text.find(':');
    if (colon != words * 8) return false;
    __be32 raw[4] = {};
    for (std::size_t i = 0; i < words; ++i) {
        std::uint32_t word = 0;
        if (!Hex(text.substr(i * 8, 8), word)) return false;
        std::memcpy(&raw[i], &word, sizeof(word));  // the words as the kernel holds them
    }
    address = AddressText(family, raw);
    return Hex(text.substr(colon + 1), port) && !address.empty();
}

std::vector<InetSocket> ReadProcNet(const Namespace& ns, SocketKind kind, int family,
                                    const std::string& what) {
    std::string path = std::string("/proc/thread-self/net/") + TableOf(kind, family);
    int fd = -1, error = 0;
    ns.Run([&] {
        fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
        error = errno;
    });
    if (fd < 0) {
        if (error == ENOENT) return {};  // no such family in this kernel
        throw HostCtlException(what + ": cannot read " + path + ": " + std::strerror(error));
    }
    std::string text;
    char buffer[65536];
    ssize_t n;
    while ((n = read(fd, buffer, sizeof(buffer))) > 0 || (n < 0 && errno == EINTR)) {
        if (n > 0) text.append(buffer, static_cast<std::size_t>(n));
    }
    error = errno;
    close(fd);
    if (n < 0) throw HostCtlException(what + ": cannot read " + path + ": " + std::strerror(error));
    return ParseProcNetSockets(text, family);
}

}  // namespace

nl_msg* BuildSocketDump(SocketKind kind, int family) {
    inet_diag_req_v2 request{};
    request.sdiag_family = static_cast<__u8>(family);
    switch (kind) {
        case SocketKind::kTcp:
            request.sdiag_protocol = IPPROTO_TCP;
            request.idiag_ext = 1 << (INET_DIAG_CONG - 1);
            break;
        case SocketKind::kUdp:
            request.sdiag_protocol = IPPROTO_UDP;
            break;
        case SocketKind::kRaw:
            // Raw sockets of every IP protocol: the dump does not filter on the protocol.
            request.sdiag_protocol = IPPROTO_RAW;
            break;
    }
    request.idiag_states = ~0U;
    nl_msg* message = nlmsg_alloc_simple(SOCK_DIAG_BY_FAMILY, NLM_F_REQUEST | NLM_F_DUMP);
    if (!message) throw HostCtlException("cannot build a socket request: out of memory");
    if (nlmsg_append(message, &request, sizeof(request), NLMSG_ALIGNTO) < 0) {
        nlmsg_free(message);
        throw HostCtlException("cannot build a socket request: out of memory");
    }
    return message;
}

std::optional<InetSocket> ParseSocket(nl_msg* message) {
    nlmsghdr* header = nlmsg_hdr(message);
    if (header->nlmsg_type != SOCK_DIAG_BY_FAMILY || !nlmsg_valid_hdr(header, sizeof(inet_diag_msg)))
        return std::nullopt;
    const auto* diag = static_cast<const inet_diag_msg*>(nlmsg_data(header));
    if (diag->idiag_family != AF_INET && diag->idiag_family != AF_INET6) return std::nullopt;
    InetSocket socket;
    socket.family = diag->idiag_family;
    socket.localAddress = AddressText(socket.family, diag->id.idiag_src);
    socket.localPort = ntohs(diag->id.idiag_sport);
    socket.remoteAddress = AddressText(socket.family, diag->id.idiag_dst);
    socket.remotePort = ntohs(diag->id.idiag_dport);
    socket.state = diag->idiag_state;
    socket.receiveQueue = diag->idiag_rqueue;
    socket.sendQueue = diag->idiag_wqueue;
    socket.uid = diag->idiag_uid;
    socket.inode = diag->idiag_inode;

    nlattr* attributes[INET_DIAG_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(inet_diag_msg), attributes, INET_DIAG_MAX, nullptr) == 0) {
        if (nlattr* cong = attributes[INET_DIAG_CONG]; cong && nla_len(cong) > 0) {
            const char* text = static_cast<const char*>(nla_data(cong));
            socket.congestionControl.assign(text, strnlen(text, static_cast<std::size_t>(nla_len(cong))));
        }
    }
    return socket;
}

std::vector<InetSocket> ParseProcNetSockets(std::string_view text, int family) {
    std::vector<InetSocket> sockets;
    std::size_t start = 0;
    while (start < text.size()) {
        std::size_t end = text.find('\n', start);
        if (end == std::string_view::npos) end = text.size();
        std::string_view line = text.substr(start, end - start);
        start = end + 1;
        // sl local remote st tx_queue:rx_queue tr:tm->when retrnsmt uid timeout inode ...
        std::vector<std::string_view> words;
        for (std::size_t at = 0; at < line.size();) {
            at = line.find_first_not_of(' ', at);
            if (at == std::string_view::npos) break;
            std::size_t stop = std::min(line.find(' ', at), line.size());
            words.push_back(line.substr(at, stop - at));
            at = stop;
        }
        if (words.size() < 10 || words[0].empty() || words[0].back() != ':') continue;
        InetSocket socket;
        socket.family = family;
        unsigned state = 0;
        auto queues = words[4].find(':');
        std::uint64_t uid = 0;
        if (!Endpoint(words[1], family, socket.localAddress, socket.localPort) ||
            !Endpoint(words[2], family, socket.remoteAddress, socket.remotePort) || !Hex(words[3], state) ||
            queues == std::string_view::npos || !Hex(words[4].substr(0, queues), socket.sendQueue) ||
            !Hex(words[4].substr(queues + 1), socket.receiveQueue) ||
            std::from_chars(words[7].data(), words[7].data() + words[7].size(), uid).ec != std::errc() ||
            std::from_chars(words[9].data(), words[9].data() + words[9].size(), socket.inode).ec !=
                std::errc())
            continue;
        socket.state = static_cast<int>(state);
        socket.uid = static_cast<std::uint32_t>(uid);
        sockets.push_back(std::move(socket));
    }
    return sockets;
}

std::vector<InetSocket> ListSockets(const Namespace& ns, SocketKind kind) {
    std::vector<InetSocket> sockets;
    nl_sock* sock = Socket(NETLINK_SOCK_DIAG, ns);
    for (int family : {AF_INET, AF_INET6}) {
        std::unique_ptr<nl_msg, MessageFree> request(BuildSocketDump(kind, family));
        std::string what = std::string("cannot list the ") + KindName(kind) + " sockets" +
                           (ns.IsOwn() ? std::string() : " of namespace " + ns.Name());
        Check(nl_send_auto(sock, request.get()), what);
        // The socket's own callbacks stay as they are: the dump reads through a copy.
        std::unique_ptr<nl_cb, CallbackPut> own(nl_socket_get_cb(sock));
        std::unique_ptr<nl_cb, CallbackPut> cb(nl_cb_clone(own.get()));
        if (!cb) throw HostCtlException(what + ": out of memory");
        std::vector<InetSocket> found;
        int dumpError = 0;
        nl_cb_set(cb.get(), NL_CB_VALID, NL_CB_CUSTOM, Collect, &found);
        nl_cb_set(cb.get(), NL_CB_FINISH, NL_CB_CUSTOM, Finish, &dumpError);
        int error = nl_recvmsgs(sock, cb.get());
        if (error == -NLE_OBJ_NOTFOUND || dumpError == ENOENT) {
            // No diagnostics for this kind (no tcp_diag, udp_diag or raw_diag): its /proc/net table.
            found = ReadProcNet(ns, kind, family, what);
        } else {
            Check(error, what);
            if (dumpError != 0) throw HostCtlException(what + ": " + std::strerror(dumpError));
        }
        sockets.insert(sockets.end(), std::make_move_iterator(found.begin()),
                       std::make_move_iterator(found.end()));
    }
    return sockets;
}

}  // namespace TknCtl::Linux::Kernel

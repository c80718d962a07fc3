#include "kernel/request.h"

#include "hostctl/network/types.h"

#include <arpa/inet.h>
#include <linux/netlink.h>
#include <netlink/msg.h>
#include <netlink/netlink.h>
#include <netlink/socket.h>
#include <sys/socket.h>
#include <sys/uio.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <memory>
#include <vector>

#include "hostctl/exception.h"
#include "kernel/dryrun.h"

#ifndef SOL_NETLINK
#define SOL_NETLINK 270
#endif

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

unsigned long g_generation = 0;

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};
struct CallbacksPut {
    void operator()(nl_cb* cb) const { nl_cb_put(cb); }
};
using Callbacks = std::unique_ptr<nl_cb, CallbacksPut>;

Callbacks CloneCallbacks(nl_sock* sock) {
    // nl_socket_get_cb hands out a reference of its own.
    Callbacks base(nl_socket_get_cb(sock));
    Callbacks cb(nl_cb_clone(base.get()));
    if (!cb) throw HostCtlException("out of memory");
    return cb;
}

// Asks the kernel to explain its refusals (a socket option any kernel since 4.12 knows; an
// older one simply gives no explanation).
void AskForReasons(nl_sock* sock) {
    int one = 1;
    static_cast<void>(setsockopt(nl_socket_get_fd(sock), SOL_NETLINK, NETLINK_EXT_ACK, &one, sizeof(one)));
}

struct Waiting {
    bool done = false;
    Answer answer;
};

int OnError(sockaddr_nl*, nlmsgerr* error, void* arg) {
    auto* waiting = static_cast<Waiting*>(arg);
    // libnl hands the payload of the NLMSG_ERROR message; its header lies just before.
    const auto* header =
        reinterpret_cast<const nlmsghdr*>(reinterpret_cast<const char*>(error) - NLMSG_HDRLEN);
    waiting->answer = ParseAnswer(header);
    waiting->done = true;
    return NL_STOP;
}

int OnAck(nl_msg*, void* arg) {
    static_cast<Waiting*>(arg)->done = true;
    return NL_STOP;
}

}  // namespace

Answer ParseAnswer(const nlmsghdr* message) {
    Answer answer;
    if (message->nlmsg_len < NLMSG_LENGTH(sizeof(nlmsgerr))) {
        answer.error = -EBADMSG;
        return answer;
    }
    const auto* error = static_cast<const nlmsgerr*>(NLMSG_DATA(message));
    answer.error = error->error;
    if (!(message->nlmsg_flags & NLM_F_ACK_TLVS)) return answer;
    // The extended attributes follow the error and the request it echoes (only the request's
    // header when the kernel capped it).
    std::size_t offset = NLMSG_HDRLEN + sizeof(nlmsgerr);
    if (!(message->nlmsg_flags & NLM_F_CAPPED) && error->msg.nlmsg_len > NLMSG_HDRLEN)
        offset += error->msg.nlmsg_len - NLMSG_HDRLEN;
    offset = NLMSG_ALIGN(offset);
    if (offset >= message->nlmsg_len) return answer;
    auto* attrs =
        reinterpret_cast<nlattr*>(const_cast<char*>(reinterpret_cast<const char*>(message) + offset));
    int remaining = static_cast<int>(message->nlmsg_len - offset);
    for (nlattr* attr = attrs; nla_ok(attr, remaining); attr = nla_next(attr, &remaining)) {
        if (nla_type(attr) != NLMSGERR_ATTR_MSG) continue;
        const char* text = static_cast<const char*>(nla_data(attr));
        answer.reason.assign(text, strnlen(text, static_cast<std::size_t>(nla_len(attr))));
    }
    return answer;
}

std::string RefusalText(const Answer& answer) {
    if (!answer.reason.empty()) return answer.reason;
    return std::strerror(answer.error < 0 ? -answer.error : answer.error);
}

Answer TryRequest(const Namespace& ns, nl_msg* message) {
    std::unique_ptr<nl_msg, MessageFree> owned(message);
    if (DryRun()) {
        RehearseRequest(ns, nlmsg_hdr(message));
        return {};
    }
    nl_sock* sock = RouteSocket(ns);
    AskForReasons(sock);
    Changed();
    Check(nl_send_auto(sock, message), "cannot send a request to the kernel");
    Callbacks cb = CloneCallbacks(sock);
    Waiting waiting;
    nl_cb_err(cb.get(), NL_CB_CUSTOM, OnError, &waiting);
    nl_cb_set(cb.get(), NL_CB_ACK, NL_CB_CUSTOM, OnAck, &waiting);
    while (!waiting.done) {
        int error = nl_recvmsgs(sock, cb.get());
        if (error < 0 && !waiting.done) Check(error, "cannot read the kernel's answer");
    }
    return waiting.answer;
}

void Request(const Namespace& ns, nl_msg* message, const std::string& what) {
    Answer answer = TryRequest(ns, message);
    if (answer.error != 0) throw HostCtlException(what + ": " + RefusalText(answer));
}

namespace {

// A netlink socket of its own for each dump, opened in the namespace and closed after: its
// replies are read here, message by message, which leaves the shared socket's sequence of
// requests and answers to libnl (and keeps no namespace alive once the dump is done).
class DumpSocket {
public:
    explicit DumpSocket(const Namespace& ns) {
        int error = 0;
        ns.Run([&] {
            fd_ = socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_ROUTE);
            error = errno;
        });
        if (fd_ < 0) {
            throw HostCtlException("cannot open a netlink socket" +
                                   (ns.IsOwn() ? std::string() : " in namespace " + ns.Name()) + ": " +
                                   std::strerror(error));
        }
        int one = 1;
        static_cast<void>(setsockopt(fd_, SOL_NETLINK, NETLINK_EXT_ACK, &one, sizeof(one)));
        // Dumps are checked strictly, so that the kernel itself leaves out what a request's
        // header filters (a routing table, say). A kernel without strict checking dumps
        // everything, and what is not wanted is left out here as well.
        static_cast<void>(setsockopt(fd_, SOL_NETLINK, NETLINK_GET_STRICT_CHK, &one, sizeof(one)));
    }
    ~DumpSocket() { close(fd_); }
    DumpSocket(const DumpSocket&) = delete;
    DumpSocket& operator=(const DumpSocket&) = delete;
    int Fd() const { return fd_; }

private:
    int fd_ = -1;
};

}  // namespace

void Dump(const Namespace& ns, int type, const void* header, std::size_t size,
          const std::function<void()>& restart, const std::function<void(const nlmsghdr*)>& each,
          const std::string& what) {
    // A namespace a dry run would make holds nothing yet.
    if (IsPlannedNamespace(ns)) return restart();
    DumpSocket sock(ns);
    // A dump comes in messages of at most 32 KiB (the kernel's bound for a reader's buffer).
    std::vector<char> buffer(64 * 1024);
    for (unsigned sequence = 1;; ++sequence) {
        restart();
        std::vector<char> request(NLMSG_SPACE(size));
        auto* message = reinterpret_cast<nlmsghdr*>(request.data());
        message->nlmsg_len = static_cast<unsigned>(NLMSG_LENGTH(size));
        message->nlmsg_type = static_cast<unsigned short>(type);
        message->nlmsg_flags = NLM_F_REQUEST | NLM_F_DUMP;
        message->nlmsg_seq = sequence;
        std::memcpy(NLMSG_DATA(message), header, size);
        sockaddr_nl kernel{};
        kernel.nl_family = AF_NETLINK;
        if (sendto(sock.Fd(), request.data(), message->nlmsg_len, 0, reinterpret_cast<sockaddr*>(&kernel),
                   sizeof(kernel)) < 0)
            throw HostCtlException(what + ": " + std::strerror(errno));

        std::exception_ptr failure;
        bool interrupted = false;
        for (bool done = false; !done;) {
            iovec part{buffer.data(), buffer.size()};
            msghdr received{};
            received.msg_iov = &part;
            received.msg_iovlen = 1;
            ssize_t length = recvmsg(sock.Fd(), &received, 0);
            if (length < 0 && errno == EINTR) continue;
            if (length < 0) throw HostCtlException(what + ": " + std::strerror(errno));
            if (received.msg_flags & MSG_TRUNC)
                throw HostCtlException(what + ": a reply was too long to read");
            int remaining = static_cast<int>(length);
            for (auto* reply = reinterpret_cast<nlmsghdr*>(buffer.data()); nlmsg_ok(reply, remaining);
                 reply = nlmsg_next(reply, &remaining)) {
                if (reply->nlmsg_seq != sequence) continue;  // what is left of an abandoned dump
                if (reply->nlmsg_flags & NLM_F_DUMP_INTR) interrupted = true;
                if (reply->nlmsg_type == NLMSG_DONE) {
                    done = true;
                    break;
                }
                if (reply->nlmsg_type == NLMSG_ERROR) {
                    Answer answer = ParseAnswer(reply);
                    if (answer.error != 0) throw HostCtlException(what + ": " + RefusalText(answer));
                    continue;
                }
                if (reply->nlmsg_type < NLMSG_MIN_TYPE || failure) continue;
                // The first failure is kept and thrown once the whole reply is read.
                try {
                    each(reply);
                } catch (...) {
                    failure = std::current_exception();
                }
            }
        }
        if (failure) std::rethrow_exception(failure);
        // The table changed while the kernel was dumping it: what came is not consistent.
        if (interrupted && sequence < 8) continue;
        return;
    }
}

unsigned long Generation() {
    return g_generation;
}

void Changed() {
    ++g_generation;
}

std::string AddressText(int family, const void* bytes, std::size_t length) {
    if (!((family == AF_INET && length >= 4) || (family == AF_INET6 && length >= 16))) return {};
    if (family == AF_INET) {
        in_addr address;
        std::memcpy(&address, bytes, sizeof(address));
        return HostCtl::Network::Ipv4Address(address).GetStringAddress();
    }
    char text[INET6_ADDRSTRLEN];
    if (!inet_ntop(family, bytes, text, sizeof(text))) return {};
    return text;
}

std::string AttributeAddress(int family, const nlattr* attr) {
    if (!attr) return {};
    return AddressText(family, nla_data(attr), static_cast<std::size_t>(nla_len(attr)));
}

bool AddressBytes(int family, const std::string& text, unsigned char bytes[16]) {
    std::memset(bytes, 0, 16);
    return (family == AF_INET || family == AF_INET6) && inet_pton(family, text.c_str(), bytes) == 1;
}

}  // namespace TknCtl::Linux::Kernel

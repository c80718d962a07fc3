// Socket dumps through sock_diag, the /proc/net tables that stand in for them, and the owners
// of sockets in /proc, without a kernel: requests and replies built in memory, a /proc tree of
// links and files in a scratch directory.
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <linux/inet_diag.h>
#include <linux/sock_diag.h>
#include <netinet/in.h>
#include <netlink/msg.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <fstream>

#include "kernel/processes.h"
#include "kernel/sockets.h"

namespace {

using namespace TknCtl::Linux::Kernel;

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};
using Message = std::unique_ptr<nl_msg, MessageFree>;

inet_diag_req_v2 RequestOf(SocketKind kind, int family) {
    Message message(BuildSocketDump(kind, family));
    nlmsghdr* header = nlmsg_hdr(message.get());
    EXPECT_EQ(header->nlmsg_type, SOCK_DIAG_BY_FAMILY);
    EXPECT_EQ(header->nlmsg_flags & (NLM_F_REQUEST | NLM_F_DUMP), NLM_F_REQUEST | NLM_F_DUMP);
    EXPECT_EQ(nlmsg_datalen(header), static_cast<int>(sizeof(inet_diag_req_v2)));
    inet_diag_req_v2 request{};
    std::memcpy(&request, nlmsg_data(header), sizeof(request));
    EXPECT_EQ(request.idiag_states, ~0U);  // every state
    return request;
}

TEST(SocketDump, AsksForEverySocketOfTheKindAndFamily) {
    auto tcp = RequestOf(SocketKind::kTcp, AF_INET6);
    EXPECT_EQ(tcp.sdiag_family, AF_INET6);
    EXPECT_EQ(tcp.sdiag_protocol, IPPROTO_TCP);
    EXPECT_EQ(tcp.idiag_ext, 1 << (INET_DIAG_CONG - 1));  // with its congestion-control algorithm
    auto udp = RequestOf(SocketKind::kUdp, AF_INET);
    EXPECT_EQ(udp.sdiag_family, AF_INET);
    EXPECT_EQ(udp.sdiag_protocol, IPPROTO_UDP);
    EXPECT_EQ(udp.idiag_ext, 0);
    EXPECT_EQ(RequestOf(SocketKind::kRaw, AF_INET).sdiag_protocol, IPPROTO_RAW);
}

// A reply as the kernel sends it: the socket's identity and queues, then its attributes.
Message Reply(int family, const char* local, const char* remote, const char* congestion = nullptr,
              int type = SOCK_DIAG_BY_FAMILY) {
    inet_diag_msg diag{};
    diag.idiag_family = static_cast<__u8>(family);
    diag.idiag_state = kTcpEstablished;
    diag.id.idiag_sport = htons(8080);
    diag.id.idiag_dport = htons(51234);
    inet_pton(family, local, diag.id.idiag_src);
    inet_pton(family, remote, diag.id.idiag_dst);
    diag.idiag_rqueue = 5;
    diag.idiag_wqueue = 17;
    diag.idiag_uid = 1000;
    diag.idiag_inode = 424242;
    Message message(nlmsg_alloc_simple(type, NLM_F_MULTI));
    nlmsg_append(message.get(), &diag, sizeof(diag), NLMSG_ALIGNTO);
    if (congestion) nla_put_string(message.get(), INET_DIAG_CONG, congestion);
    return message;
}

TEST(SocketReply, ReadsIdentityQueuesOwnerAndAlgorithm) {
    InetSocket v4{AF_INET, "192.0.2.10", 8080, "198.51.100.7", 51234, kTcpEstablished,
                  5,       17,           1000, 424242,         "bbr"};
    EXPECT_EQ(ParseSocket(Reply(AF_INET, "192.0.2.10", "198.51.100.7", "bbr").get()), v4);
    auto v6 = ParseSocket(Reply(AF_INET6, "2001:db8::1", "::ffff:192.0.2.1").get());
    ASSERT_TRUE(v6);
    EXPECT_EQ(v6->localAddress, "2001:db8::1");
    EXPECT_EQ(v6->remoteAddress, "::ffff:192.0.2.1");
    EXPECT_EQ(v6->congestionControl, "");  // UDP, raw and TIME_WAIT sockets have none

    // Not sockets: the end of the dump, another family, a message cut short.
    EXPECT_FALSE(ParseSocket(Reply(AF_INET, "192.0.2.10", "0.0.0.0", nullptr, NLMSG_DONE).get()));
    EXPECT_FALSE(ParseSocket(Reply(AF_UNIX, "", "").get()));
    Message cut(nlmsg_alloc_simple(SOCK_DIAG_BY_FAMILY, NLM_F_MULTI));
    std::uint32_t word = AF_INET;
    nlmsg_append(cut.get(), &word, sizeof(word), NLMSG_ALIGNTO);
    EXPECT_FALSE(ParseSocket(cut.get()));
}

// What ss reads where the kernel has no diagnostics for a kind (raw_diag is often left out).
TEST(ProcNetTables, ReadLikeDumpReplies) {
    const char* raw =
        R"(  sl  local_address rem_address   st tx_queue rx_queue tr tm->when retrnsmt   uid  timeout inode
   1: 0100007F:0001 0102000A:0000 07 00000010:00000200 00:00000000 00000000  1000        0 31337 2 0000000000000000 0
   x: damaged line
   2: 0100007F:0001
)";
    InetSocket icmp{AF_INET, "127.0.0.1", 1, "10.0.2.1", 0, kTcpClose, 512, 16, 1000, 31337, ""};
    EXPECT_EQ(ParseProcNetSockets(raw, AF_INET), std::vector<InetSocket>{icmp});

    const char* raw6 = R"(  sl  local_address                         remote_address                        st
   58: B80D0120000000000000000001000000:003A 00000000000000000000000000000000:0000 07 00000000:00000000 00:00000000 00000000     0        0 4243 2 0000000000000000 0
   58: 0100007F:003A 00000000:0000 07 00000000:00000000 00:00000000 00000000     0        0 1 2 0 0
)";
    auto sockets = ParseProcNetSockets(raw6, AF_INET6);
    ASSERT_EQ(sockets.size(), 1u);  // an IPv4 line is no IPv6 socket
    EXPECT_EQ(sockets[0].localAddress, "2001:db8::1");
    EXPECT_EQ(sockets[0].localPort, 58);
}

TEST(SocketOwners, EachSocketGoesToTheLowestPidThatHoldsIt) {
    EXPECT_EQ(SocketInodeOfLink("socket:[12345]"), 12345u);
    for (const char* other :
         {"pipe:[12345]", "socket:[]", "socket:[12a]", "socket:[123", "socket:[99999999999999999999]"})
        EXPECT_EQ(SocketInodeOfLink(other), 0u) << other;

    std::string root =
        (std::filesystem::temp_directory_path() / ("hadro-proc-" + std::to_string(getpid()))).string();
    std::filesystem::remove_all(root);
    auto process = [&](int pid, const char* name, std::initializer_list<const char*> links) {
        std::string dir = root + "/" + std::to_string(pid);
        std::filesystem::create_directories(dir + "/fd");
        std::ofstream(dir + "/comm") << name << '\n';
        int fd = 0;
        for (const char* link : links)
            symlink(link, (dir + "/fd/" + std::to_string(fd++)).c_str());
    };
    process(4242, "nginx", {"/dev/null", "socket:[100]", "socket:[200]"});
    process(977, "nginx", {"socket:[100]"});
    process(12, "sshd", {"pipe:[5]", "socket:[300]"});
    std::filesystem::create_directories(root + "/self/fd");  // not a process directory
    std::filesystem::create_directories(root + "/55");       // a process whose descriptors are hidden

    auto owners = SocketOwners({100, 200, 300, 400}, root);
    EXPECT_EQ(owners.size(), 3u);
    EXPECT_EQ(owners[100].pid, 977u);
    EXPECT_EQ(owners[100].name, "nginx");
    EXPECT_EQ(owners[200].pid, 4242u);
    EXPECT_EQ(owners[300].name, "sshd");
    EXPECT_EQ(ProcessName(12, root), "sshd");
    EXPECT_FALSE(ProcessName(55, root));
    std::filesystem::remove_all(root);
}

}  // namespace

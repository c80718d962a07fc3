// Socket dumps through sock_diag and the owners of sockets in /proc, without a kernel: requests
// and replies built in memory, a /proc tree of links and files in a scratch directory.
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <linux/inet_diag.h>
#include <linux/sock_diag.h>
#include <netinet/in.h>
#include <netlink/msg.h>
#include <sys/stat.h>
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

inet_diag_req_v2 RequestOf(nl_msg* message) {
    inet_diag_req_v2 request{};
    std::memcpy(&request, nlmsg_data(nlmsg_hdr(message)), sizeof(request));
    return request;
}

TEST(SocketDump, AsksForEverySocketOfTheKindAndFamilyInEveryState) {
    Message tcp(BuildSocketDump(SocketKind::kTcp, AF_INET6));
    nlmsghdr* header = nlmsg_hdr(tcp.get());
    EXPECT_EQ(header->nlmsg_type, SOCK_DIAG_BY_FAMILY);
    EXPECT_EQ(header->nlmsg_flags & (NLM_F_REQUEST | NLM_F_DUMP), NLM_F_REQUEST | NLM_F_DUMP);
    EXPECT_EQ(nlmsg_datalen(header), static_cast<int>(sizeof(inet_diag_req_v2)));
    auto request = RequestOf(tcp.get());
    EXPECT_EQ(request.sdiag_family, AF_INET6);
    EXPECT_EQ(request.sdiag_protocol, IPPROTO_TCP);
    EXPECT_EQ(request.idiag_ext, 1 << (INET_DIAG_CONG - 1));  // the congestion-control algorithm
    EXPECT_EQ(request.idiag_states, ~0U);
    EXPECT_EQ(request.id.idiag_sport, 0);  // no filter on ports

    Message udp(BuildSocketDump(SocketKind::kUdp, AF_INET));
    EXPECT_EQ(RequestOf(udp.get()).sdiag_family, AF_INET);
    EXPECT_EQ(RequestOf(udp.get()).sdiag_protocol, IPPROTO_UDP);
    EXPECT_EQ(RequestOf(udp.get()).idiag_ext, 0);

    Message raw(BuildSocketDump(SocketKind::kRaw, AF_INET));
    EXPECT_EQ(RequestOf(raw.get()).sdiag_protocol, IPPROTO_RAW);
    EXPECT_EQ(RequestOf(raw.get()).idiag_states, ~0U);
}

// A reply as the kernel sends it: the socket's identity and queues, then its attributes.
Message Reply(const inet_diag_msg& diag, const char* congestion = nullptr, int type = SOCK_DIAG_BY_FAMILY) {
    Message message(nlmsg_alloc_simple(type, NLM_F_MULTI));
    nlmsg_append(message.get(), const_cast<inet_diag_msg*>(&diag), sizeof(diag), NLMSG_ALIGNTO);
    if (congestion) nla_put_string(message.get(), INET_DIAG_CONG, congestion);
    return message;
}

inet_diag_msg Ipv4Socket() {
    inet_diag_msg diag{};
    diag.idiag_family = AF_INET;
    diag.idiag_state = kTcpEstablished;
    diag.id.idiag_sport = htons(8080);
    diag.id.idiag_dport = htons(51234);
    inet_pton(AF_INET, "192.0.2.10", diag.id.idiag_src);
    inet_pton(AF_INET, "198.51.100.7", diag.id.idiag_dst);
    diag.idiag_rqueue = 5;
    diag.idiag_wqueue = 17;
    diag.idiag_uid = 1000;
    diag.idiag_inode = 424242;
    return diag;
}

TEST(SocketReply, ReadsAddressesPortsStateQueuesOwnerAndAlgorithm) {
    auto socket = ParseSocket(Reply(Ipv4Socket(), "bbr").get());
    ASSERT_TRUE(socket);
    EXPECT_EQ(socket->family, AF_INET);
    EXPECT_EQ(socket->localAddress, "192.0.2.10");
    EXPECT_EQ(socket->localPort, 8080);
    EXPECT_EQ(socket->remoteAddress, "198.51.100.7");
    EXPECT_EQ(socket->remotePort, 51234);
    EXPECT_EQ(socket->state, kTcpEstablished);
    EXPECT_EQ(socket->receiveQueue, 5u);
    EXPECT_EQ(socket->sendQueue, 17u);
    EXPECT_EQ(socket->uid, 1000u);
    EXPECT_EQ(socket->inode, 424242u);
    EXPECT_EQ(socket->congestionControl, "bbr");

    // IPv6, a mapped IPv4 peer, no algorithm (a UDP or raw socket, a TIME_WAIT one).
    inet_diag_msg v6{};
    v6.idiag_family = AF_INET6;
    v6.idiag_state = kTcpClose;
    v6.id.idiag_sport = htons(58);
    inet_pton(AF_INET6, "2001:db8::1", v6.id.idiag_src);
    inet_pton(AF_INET6, "::ffff:192.0.2.1", v6.id.idiag_dst);
    socket = ParseSocket(Reply(v6).get());
    ASSERT_TRUE(socket);
    EXPECT_EQ(socket->localAddress, "2001:db8::1");
    EXPECT_EQ(socket->remoteAddress, "::ffff:192.0.2.1");
    EXPECT_EQ(socket->localPort, 58);
    EXPECT_EQ(socket->congestionControl, "");
    EXPECT_EQ(socket->inode, 0u);
}

TEST(SocketReply, OtherMessagesAreNoSockets) {
    auto diag = Ipv4Socket();
    EXPECT_FALSE(ParseSocket(Reply(diag, nullptr, NLMSG_DONE).get()));
    diag.idiag_family = AF_UNIX;
    EXPECT_FALSE(ParseSocket(Reply(diag).get()));
    // Cut short: less than the socket's fixed part.
    Message shortMessage(nlmsg_alloc_simple(SOCK_DIAG_BY_FAMILY, NLM_F_MULTI));
    std::uint32_t word = AF_INET;
    nlmsg_append(shortMessage.get(), &word, sizeof(word), NLMSG_ALIGNTO);
    EXPECT_FALSE(ParseSocket(shortMessage.get()));
    // An attribute longer than its message is left out; the socket itself is read.
    Message damaged = Reply(Ipv4Socket(), "cubic");
    nlattr* attribute = static_cast<nlattr*>(nlmsg_tail(nlmsg_hdr(damaged.get())));
    attribute = reinterpret_cast<nlattr*>(reinterpret_cast<char*>(attribute) - NLA_ALIGN(NLA_HDRLEN + 6));
    attribute->nla_len = 4000;
    auto socket = ParseSocket(damaged.get());
    ASSERT_TRUE(socket);
    EXPECT_EQ(socket->localPort, 8080);
    EXPECT_EQ(socket->congestionControl, "");
}

// What a kernel without raw_diag offers instead (as ss reads it): /proc/net/raw and raw6.
TEST(ProcNetTables, ReadLikeDumpReplies) {
    const char* raw =
        R"(  sl  local_address rem_address   st tx_queue rx_queue tr tm->when retrnsmt   uid  timeout inode ref pointer drops
   1: 0100007F:0001 00000000:0000 07 00000010:00000200 00:00000000 00000000     0        0 31337 2 0000000000000000 0
  17: 0A0200C0:0011 0102000A:0000 01 00000000:00000000 00:00000000 00000000  1000        0 0 2 0000000000000000 0
   x: damaged line
   2: 0100007F:0001
)";
    auto sockets = ParseProcNetSockets(raw, AF_INET);
    ASSERT_EQ(sockets.size(), 2u);
    EXPECT_EQ(sockets[0].localAddress, "127.0.0.1");
    EXPECT_EQ(sockets[0].localPort, 1);  // ICMP
    EXPECT_EQ(sockets[0].remoteAddress, "0.0.0.0");
    EXPECT_EQ(sockets[0].state, kTcpClose);
    EXPECT_EQ(sockets[0].sendQueue, 16u);
    EXPECT_EQ(sockets[0].receiveQueue, 512u);
    EXPECT_EQ(sockets[0].inode, 31337u);
    EXPECT_EQ(sockets[1].localAddress, "192.0.2.10");
    EXPECT_EQ(sockets[1].remoteAddress, "10.0.2.1");
    EXPECT_EQ(sockets[1].state, kTcpEstablished);
    EXPECT_EQ(sockets[1].uid, 1000u);
    EXPECT_EQ(sockets[1].inode, 0u);

    const char* raw6 =
        R"(  sl  local_address                         remote_address                        st tx_queue rx_queue tr tm->when retrnsmt   uid  timeout inode ref pointer drops
   58: 00000000000000000000000000000000:003A 00000000000000000000000000000000:0000 07 00000000:00000000 00:00000000 00000000     0        0 4242 2 0000000000000000 0
   58: B80D0120000000000000000001000000:003A 00000000000000000000000000000000:0000 07 00000000:00000000 00:00000000 00000000     0        0 4243 2 0000000000000000 0
   58: 0100007F:003A 00000000:0000 07 00000000:00000000 00:00000000 00000000     0        0 1 2 0 0
)";
    sockets = ParseProcNetSockets(raw6, AF_INET6);
    ASSERT_EQ(sockets.size(), 2u);  // an IPv4 line is no IPv6 socket
    EXPECT_EQ(sockets[0].localAddress, "::");
    EXPECT_EQ(sockets[0].localPort, 58);
    EXPECT_EQ(sockets[1].localAddress, "2001:db8::1");
    EXPECT_TRUE(ParseProcNetSockets("", AF_INET).empty());
}

TEST(SocketOwners, LinksNameSocketsByInode) {
    EXPECT_EQ(SocketInodeOfLink("socket:[12345]"), 12345u);
    EXPECT_EQ(SocketInodeOfLink("socket:[18446744073709551615]"), 18446744073709551615u);
    for (const char* other : {"pipe:[12345]", "socket:[]", "socket:[12a]", "socket:[123", "/dev/null",
                              "socket:[99999999999999999999]", ""})
        EXPECT_EQ(SocketInodeOfLink(other), 0u) << other;
}

class ProcTree : public ::testing::Test {
protected:
    void SetUp() override {
        root_ =
            (std::filesystem::temp_directory_path() / ("hadro-proc-" + std::to_string(getpid()))).string();
        std::filesystem::remove_all(root_);
        std::filesystem::create_directories(root_);
    }
    void TearDown() override { std::filesystem::remove_all(root_); }

    void Process(int pid, const std::string& name, std::initializer_list<const char*> links) {
        std::string dir = root_ + "/" + std::to_string(pid);
        std::filesystem::create_directories(dir + "/fd");
        std::ofstream(dir + "/comm") << name << '\n';
        int fd = 0;
        for (const char* link : links)
            symlink(link, (dir + "/fd/" + std::to_string(fd++)).c_str());
    }

    std::string root_;
};

TEST_F(ProcTree, EachSocketGoesToTheLowestPidThatHoldsIt) {
    Process(4242, "nginx", {"/dev/null", "socket:[100]", "socket:[200]"});
    Process(977, "nginx", {"socket:[100]"});
    Process(12, "sshd", {"pipe:[5]", "socket:[300]"});
    std::filesystem::create_directories(root_ + "/self/fd");  // not a process directory
    std::filesystem::create_directories(root_ + "/55");       // a process whose descriptors are hidden

    auto owners = SocketOwners({100, 200, 300, 400}, root_);
    ASSERT_EQ(owners.size(), 3u);
    EXPECT_EQ(owners[100].pid, 977u);
    EXPECT_EQ(owners[100].name, "nginx");
    EXPECT_EQ(owners[200].pid, 4242u);
    EXPECT_EQ(owners[300].pid, 12u);
    EXPECT_EQ(owners[300].name, "sshd");
    EXPECT_FALSE(owners.count(400));
    EXPECT_TRUE(SocketOwners({}, root_).empty());

    EXPECT_EQ(ProcessName(12, root_), "sshd");
    EXPECT_FALSE(ProcessName(55, root_));
    EXPECT_FALSE(ProcessName(0, root_));
}

}  // namespace

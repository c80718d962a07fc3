// Connections of the Linux host: the TCP, UDP and raw sockets of each netstack's namespace
// with the process that holds each. Sockets are opened by helper processes (python3); `ss` is
// the oracle.
#include <signal.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <map>
#include <sstream>
#include <thread>

#include "namespace_host.h"

namespace {

using nlohmann::json;

// Opens sockets and keeps them until it is killed: a listener on 127.0.0.1:8080 with one
// accepted connection (5 bytes waiting in it), a UDP socket on 5353, [::1]:8443 listening,
// raw ICMP and ICMPv6 sockets, and a connection it closed itself (left in FIN_WAIT_2 without
// an owner; its peer, still held, in CLOSE_WAIT).
const char* const kSockets = R"(
import socket, signal, sys
listener = socket.socket(); listener.bind(("127.0.0.1", 8080)); listener.listen(16)
client = socket.create_connection(("127.0.0.1", 8080)); served, _ = listener.accept()
client.send(b"hello")
udp = socket.socket(socket.AF_INET, socket.SOCK_DGRAM); udp.bind(("0.0.0.0", 5353))
six = socket.socket(socket.AF_INET6); six.bind(("::1", 8443)); six.listen(4)
icmp = socket.socket(socket.AF_INET, socket.SOCK_RAW, socket.IPPROTO_ICMP)
icmp6 = socket.socket(socket.AF_INET6, socket.SOCK_RAW, socket.IPPROTO_ICMPV6)
closing = socket.create_connection(("127.0.0.1", 8080)); kept, _ = listener.accept(); closing.close()
open(sys.argv[1], "w").write("ready")
signal.pause()
)";

class ConnectionsTest : public Hadro::Test::NamespaceHostTest {
protected:
    void TearDown() override {
        for (int pid : helpers_)
            kill(pid, SIGKILL);
        NamespaceHostTest::TearDown();
    }

    // Starts the helper (inside a named namespace when one is given) and waits until its sockets
    // are open; its PID.
    int StartHelper(const std::string& netns = {}) {
        std::string script = dir_ + "/sockets.py", ready = dir_ + "/ready" + std::to_string(helpers_.size());
        std::ofstream(script) << kSockets;
        std::string prefix = netns.empty() ? "" : "ip netns exec " + netns + " ";
        int pid =
            std::stoi(Sh(prefix + "/usr/bin/python3 " + script + " " + ready + " >/dev/null 2>&1 & echo $!"));
        helpers_.push_back(pid);
        for (int i = 0; i < 100 && !std::filesystem::exists(ready); ++i)
            std::this_thread::sleep_for(std::chrono::milliseconds(50));
        EXPECT_TRUE(std::filesystem::exists(ready)) << "the helper did not open its sockets";
        return pid;
    }

    // What ss says of the sockets of one class: "local foreign" -> "state recvq sendq pid".
    std::map<std::string, std::string> Oracle(const std::string& option, const std::string& netns = {}) {
        std::string prefix = netns.empty() ? "" : "ip netns exec " + netns + " ";
        std::istringstream lines(Sh(prefix + "ss -anpH " + option));
        std::map<std::string, std::string> sockets;
        for (std::string line; std::getline(lines, line);) {
            std::istringstream words(line);
            std::string state, recvQ, sendQ, local, foreign, users;
            words >> state >> recvQ >> sendQ >> local >> foreign >> users;
            auto pid = users.find("pid=");
            std::string owner =
                pid == std::string::npos ? "0" : users.substr(pid + 4, users.find(',', pid) - pid - 4);
            sockets[Plain(local) + " " + Plain(foreign)] = state + " " + recvQ + " " + sendQ + " " + owner;
        }
        return sockets;
    }

    // The same from hadrocli's records of one class.
    static std::map<std::string, std::string> Listed(const json& records, const std::string& proto) {
        static const std::map<std::string, std::string> kStates = {
            {"LISTEN", "LISTEN"},         {"ESTABLISHED", "ESTAB"},     {"CLOSED", "UNCONN"},
            {"FIN_WAIT_2", "FIN-WAIT-2"}, {"CLOSE_WAIT", "CLOSE-WAIT"}, {"TIME_WAIT", "TIME-WAIT"}};
        std::map<std::string, std::string> sockets;
        for (const auto& r : records) {
            if (r["Proto"] != proto) continue;
            auto state = kStates.find(r["State"].get<std::string>());
            sockets[Plain(r["Local Address"]) + " " + Plain(r["Foreign Address"])] =
                (state == kStates.end() ? r["State"].get<std::string>() : state->second) + " " +
                std::to_string(r["Recv Q"].get<int>()) + " " + std::to_string(r["Send Q"].get<int>()) + " " +
                std::to_string(r["World ID"].get<int>());
        }
        return sockets;
    }

    // An endpoint as both write it: ss writes "*" for any address or port, brackets IPv6
    // addresses and may add "%device".
    static std::string Plain(std::string endpoint) {
        auto colon = endpoint.rfind(':');
        std::string address = endpoint.substr(0, colon), port = endpoint.substr(colon + 1);
        if (auto percent = address.find('%'); percent != std::string::npos) address.erase(percent);
        if (!address.empty() && address.front() == '[') address = address.substr(1, address.size() - 2);
        if (address == "*" || address == "0.0.0.0" || address == "::") address = "any";
        if (port == "*") port = "0";
        return address + ":" + port;
    }

    std::vector<int> helpers_;
};

TEST_F(ConnectionsTest, ListsTheSocketsOfEachClassWithTheirOwnersAsSsDoes) {
    Sh("sysctl -qw net.ipv4.tcp_congestion_control=reno");
    int pid = StartHelper();
    auto records = HadroJson("network ip connection list");
    ASSERT_TRUE(records.is_array());
    EXPECT_EQ(Listed(records, "tcp"), Oracle("-t"));
    EXPECT_EQ(Listed(records, "udp"), Oracle("-u"));
    EXPECT_EQ(Listed(records, "ip"), Oracle("-w"));
    EXPECT_EQ(Listed(records, "tcp").size(), 6u);
    EXPECT_EQ(Listed(records, "ip").size(), 2u);

    // TCP first, then UDP, then raw IP; the owner by its PID and name.
    std::string order;
    for (const auto& r : records) {
        std::string proto = r["Proto"];
        if (order.empty() || order.substr(order.rfind(' ') + 1) != proto) order += " " + proto;
    }
    EXPECT_EQ(order, " tcp udp ip");
    bool sawListener = false;
    for (const auto& r : records) {
        if (r["Local Address"] == "127.0.0.1:8080" && r["State"] == "LISTEN") {
            sawListener = true;
            EXPECT_EQ(r["Foreign Address"], "0.0.0.0:0");
            EXPECT_EQ(r["World ID"], pid);
            EXPECT_EQ(r["World Name"], "python3");
            EXPECT_EQ(r["CC Algo"], "newreno");
            EXPECT_EQ(r["Send Q"], 16);  // a listener's backlog
        }
        if (r["State"] == "FIN_WAIT_2") {
            EXPECT_EQ(r["World ID"], 0);  // no process holds it any more
            EXPECT_EQ(r["World Name"], "");
        }
        if (r["Proto"] == "udp") {
            EXPECT_EQ(r["CC Algo"], "");
            EXPECT_EQ(r["State"], "CLOSED");
        }
    }
    EXPECT_TRUE(sawListener);

    auto raw = HadroJson("network ip connection list -t ip");
    ASSERT_EQ(raw.size(), 2u);
    EXPECT_EQ(raw[0]["Local Address"], "0.0.0.0:1");  // a raw socket's port is its protocol
    EXPECT_EQ(raw[1]["Local Address"], "[::]:58");
    EXPECT_EQ(raw[0]["World ID"], pid);
}

TEST_F(ConnectionsTest, EachNetstackHasItsOwnSockets) {
    Sh("ip netns add glidex && ip -n glidex link set lo up");
    int pid = StartHelper("glidex");
    auto records = HadroJson("network ip connection list -N glidex -t udp");
    ASSERT_EQ(records.size(), 1u);
    EXPECT_EQ(records[0]["Local Address"], "0.0.0.0:5353");
    EXPECT_EQ(records[0]["World ID"], pid);
    EXPECT_EQ(Listed(HadroJson("network ip connection list -N glidex"), "tcp"), Oracle("-t", "glidex"));
    EXPECT_EQ(HadroJson("network ip connection list"), json::array());

    auto unknown = Hadro("network ip connection list -N nowhere");
    EXPECT_EQ(unknown.status, 1);
    EXPECT_EQ(unknown.err, "Unable to get connection list.\nNetstack instance 'nowhere' does not exist\n");
}

TEST_F(ConnectionsTest, OwnersAUserMayNotSeeAreNone) {
    StartHelper();
    auto result = HadroUnprivileged("--formatter=json network ip connection list -t tcp");
    ASSERT_EQ(result.status, 0) << result.All();
    auto records = json::parse(result.out);
    EXPECT_EQ(records.size(), 6u);
    for (const auto& r : records) {
        EXPECT_EQ(r["World ID"], 0) << r;
        EXPECT_EQ(r["World Name"], "") << r;
    }
    // Another netstack's sockets need its namespace, which only root may enter.
    Sh("ip netns add blue");
    auto blue = HadroUnprivileged("network ip connection list -N blue");
    EXPECT_EQ(blue.status, 1);
    EXPECT_EQ(blue.err.rfind("Unable to get connection list.\ncannot enter network namespace blue", 0), 0u)
        << blue.err;
}

}  // namespace

// Changes that roll back by themselves on the Linux host: --confirm-within, --confirm,
// --rollback, and atomic batches, in a host each test builds in namespaces of its own. What the
// peer tools show (ip -j -d, bridge, tc, nft, ip xfrm, the resolver files, the document) must be
// what they showed before the change once it is rolled back.
#include <dirent.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <functional>
#include <map>
#include <sstream>
#include <thread>

#include "namespace_host.h"

namespace {

using nlohmann::json;
using Clock = std::chrono::steady_clock;
using namespace std::chrono_literals;

std::string NetnsOf(const std::string& pid) {
    char target[256];
    ssize_t n = readlink(("/proc/" + pid + "/ns/net").c_str(), target, sizeof(target) - 1);
    return n > 0 ? std::string(target, static_cast<std::size_t>(n)) : std::string();
}

// Keys whose values the kernel gives anew when it makes an object again (handles, port numbers,
// the namespace IDs of veth peers) or that count time and traffic.
bool Volatile(const std::string& key) {
    static const char* const kKeys[] = {"link_netnsid", "stats",    "stats64",         "handle", "id",
                                        "no",           "metainfo", "designated_port", "refcnt"};
    if (std::find(std::begin(kKeys), std::end(kKeys), key) != std::end(kKeys)) return true;
    return key.size() > 6 && key.compare(key.size() - 6, 6, "_timer") == 0;
}

json Normal(const json& value) {
    if (value.is_object()) {
        json out = json::object();
        for (const auto& [key, item] : value.items()) {
            if (!Volatile(key)) out[key] = Normal(item);
        }
        return out;
    }
    if (value.is_array()) {
        json out = json::array();
        for (const auto& item : value)
            out.push_back(Normal(item));
        return out;
    }
    return value;
}

class CheckpointTest : public Hadro::Test::NamespaceHostTest {
protected:
    // A host: NIC e1 (a veth whose other end plays the wire), switch vs1 with uplink e1, port
    // groups pg and pg2, interface tkn0 on pg with an address, a static route through it and a
    // permanent neighbour, the firewall loaded, an IPsec policy.
    void SetUp() override {
        NamespaceHostTest::SetUp();
        if (IsSkipped() || dir_.empty()) return;
        checkpoint_ = document_ + ".checkpoint";
        Configure("nics = e?\n");
        // Addresses are usable at once: no duplicate address detection to wait for.
        Sh("sysctl -qw net.ipv6.conf.all.accept_dad=0 net.ipv6.conf.default.accept_dad=0");
        Sh("ip link add e1 type veth peer name e1-wire && ip link set e1-wire up");
        for (const char* step :
             {"vswitch standard add -v vs1", "vswitch standard uplink add -v vs1 -u e1",
              "vswitch standard portgroup add -v vs1 -p pg", "vswitch standard portgroup add -v vs1 -p pg2",
              "ip interface add -p pg",
              "ip interface ipv4 set -i tkn0 -t static -I 10.1.0.1 -N 255.255.255.0",
              "ip interface tag add -i tkn0 -t Management", "firewall load",
              "ip ipsec sp add -n web -s 2001:db8:1::/64 -d any -p 443 -P 0 -u tcp -A none"})
            ASSERT_TRUE(Ok(std::string("network ") + step));
        Sh("ip route add 10.9.0.0/16 via 10.1.0.2 metric 5 proto static");
        Sh("ip neigh add 10.1.0.7 lladdr 02:00:00:00:00:07 dev tkn0 nud permanent");
        Sh("ip neigh add 10.1.0.8 lladdr 02:00:00:00:00:08 dev tkn0 nud permanent");
    }

    // No watcher outlives its test: every process left in the test's network namespace goes.
    void TearDown() override {
        if (!dir_.empty()) {
            auto left = Watchers();
            for (pid_t pid : left)
                kill(pid, SIGKILL);
            Eventually([&] { return Watchers().empty(); }, 5s);
        }
        NamespaceHostTest::TearDown();
    }

    std::vector<pid_t> Watchers() {
        std::vector<pid_t> out;
        const std::string own = NetnsOf("self");
        if (DIR* proc = opendir("/proc")) {
            while (const dirent* entry = readdir(proc)) {
                std::string name = entry->d_name;
                if (name.empty() || !std::all_of(name.begin(), name.end(), ::isdigit)) continue;
                if (std::stoi(name) == getpid() || NetnsOf(name) != own) continue;
                // A zombie waiting for its parent has no namespace left to do anything in.
                if (Hadro::Test::Slurp("/proc/" + name + "/stat").find(") Z ") != std::string::npos) continue;
                out.push_back(std::stoi(name));
            }
            closedir(proc);
        }
        return out;
    }

    static bool Eventually(const std::function<bool()>& done, std::chrono::milliseconds within) {
        const auto end = Clock::now() + within;
        while (!done()) {
            if (Clock::now() > end) return false;
            std::this_thread::sleep_for(100ms);
        }
        return true;
    }

    ::testing::AssertionResult Ok(const std::string& arguments) {
        auto result = Hadro(arguments);
        if (result.status == 0 && result.err.empty()) return ::testing::AssertionSuccess();
        return ::testing::AssertionFailure() << arguments << ": exit " << result.status << "\n"
                                             << result.All();
    }

    // What the peer tools show of the host.
    json HostState() {
        json out;
        std::vector<std::string> netstacks{""};
        for (const auto& entry : std::filesystem::directory_iterator("/run/netns"))
            netstacks.push_back(entry.path().filename());
        std::sort(netstacks.begin() + 1, netstacks.end());
        for (const auto& ns : netstacks) {
            const std::string in = ns.empty() ? "" : " -n " + ns;
            json& n = out[ns.empty() ? "(own)" : ns];
            n["link"] = Normal(ShJson("ip" + in + " -j -d link show"));
            n["addr"] = Normal(ShJson("ip" + in + " -j -d addr show"));
            n["route4"] = ShJson("ip" + in + " -j -d -4 route show table all");
            n["route6"] = ShJson("ip" + in + " -j -d -6 route show table all");
            n["neigh"] = ShJson("ip" + in + " -j -d neigh show nud permanent");
            n["bridge"] = Normal(ShJson("bridge" + in + " -j -d link show"));
            n["qdisc"] = Normal(ShJson("tc" + in + " -j qdisc show"));
            n["resolv"] =
                Hadro::Test::Slurp(ns.empty() ? "/etc/resolv.conf" : "/etc/netns/" + ns + "/resolv.conf");
        }
        auto nft = Try("nft -j list table inet hadro");
        out["nft"] = nft.status == 0 ? Normal(json::parse(nft.out)) : json("no table");
        std::vector<std::string> policies;
        std::string block;
        std::istringstream xfrm(Sh("ip xfrm policy"));
        for (std::string line; std::getline(xfrm, line);) {
            if (!line.empty() && line[0] != '\t' && !block.empty()) {
                policies.push_back(block);
                block.clear();
            }
            block += line + "\n";
        }
        if (!block.empty()) policies.push_back(block);
        std::sort(policies.begin(), policies.end());
        out["xfrm"] = policies;
        out["netns files"] = Sh("ls -R /etc/netns 2>/dev/null || true");
        out["document"] = Hadro::Test::Slurp(document_);
        return out;
    }

    // The host's state once it is steady (the kernel settles link states and addresses).
    json Steady() {
        json state = HostState();
        for (int i = 0; i < 30; ++i) {
            std::this_thread::sleep_for(100ms);
            json again = HostState();
            if (again == state) return state;
            state = std::move(again);
        }
        return state;
    }

    // Whether the host comes back to what it was within the time given; otherwise says what
    // differs.
    ::testing::AssertionResult BackTo(const json& before, std::chrono::milliseconds within = 10s) {
        json now;
        bool same = Eventually(
            [&] {
                now = HostState();
                return now == before;
            },
            within);
        if (same) return ::testing::AssertionSuccess();
        auto failure = ::testing::AssertionFailure();
        for (const auto& [key, value] : before.items()) {
            if (!now.contains(key)) {
                failure << key << " is gone\n";
            } else if (value.is_object()) {
                for (const auto& [part, shown] : value.items()) {
                    if (now[key][part] != shown)
                        failure << key << " " << part << ":\n  before " << shown.dump() << "\n  now    "
                                << now[key][part].dump() << "\n";
                }
            } else if (now[key] != value) {
                failure << key << ":\n  before " << value.dump() << "\n  now    " << now[key].dump() << "\n";
            }
        }
        for (const auto& [key, value] : now.items()) {
            if (!before.contains(key)) failure << key << " is new\n";
        }
        return failure;
    }

    // hadrocli --confirm-within ... --batch reading its lines from a FIFO (lines: its writing
    // end), in a process group of its own; its output goes to dir_/batch.out and batch.err.
    pid_t StartBatch(const std::string& options, int& lines) {
        const std::string fifo = dir_ + "/lines";
        if (mkfifo(fifo.c_str(), 0600) != 0) return -1;
        pid_t child = fork();
        if (child == 0) {
            setpgid(0, 0);
            const std::string command = std::string("exec '") + HADROCLI + "' --plugin-dir='" +
                                        HADRO_PLUGIN_DIR + "' --backend=linux " + options + " --batch - <'" +
                                        fifo + "' >'" + dir_ + "/batch.out' 2>'" + dir_ + "/batch.err'";
            execl("/bin/sh", "sh", "-c", command.c_str(), static_cast<char*>(nullptr));
            _exit(127);
        }
        if (child > 0) setpgid(child, child);
        lines = open(fifo.c_str(), O_WRONLY);
        return child;
    }
    static bool Send(int lines, const std::string& line) {
        const std::string text = line + "\n";
        return write(lines, text.data(), text.size()) == static_cast<ssize_t>(text.size());
    }

    bool HasRoute(const std::string& destination) {
        return !ShJson("ip -j route show " + destination).empty();
    }
    bool Pending() { return std::filesystem::exists(checkpoint_ + "/pending.json"); }
    json PendingFile() { return json::parse(Hadro::Test::Slurp(checkpoint_ + "/pending.json")); }

    std::string checkpoint_;
};

std::string Lines(const std::vector<std::string>& lines) {
    std::string text;
    for (const auto& line : lines)
        text += line + "\n";
    return text;
}

int Count(const std::string& text, const std::string& part) {
    int n = 0;
    for (auto at = text.find(part); at != std::string::npos; at = text.find(part, at + 1))
        ++n;
    return n;
}

// ---------------------------------------------------------------- --confirm-within

TEST_F(CheckpointTest, AChangeNobodyConfirmsIsUndoneWhenItsTimeComesAndNotBefore) {
    const json before = Steady();
    const auto start = Clock::now();
    ASSERT_TRUE(Ok("--confirm-within=2 network ip route ipv4 add -n 10.20.0.0/16 -g 10.1.0.2"));
    EXPECT_TRUE(HasRoute("10.20.0.0/16"));

    // The checkpoint lies beside the document: what is pending for everyone to see, the
    // snapshot for root alone, no key anywhere.
    struct stat info {};
    ASSERT_EQ(stat((checkpoint_ + "/pending.json").c_str(), &info), 0);
    EXPECT_EQ(info.st_mode & 0777, 0644u);
    ASSERT_EQ(stat((checkpoint_ + "/snapshot.json").c_str(), &info), 0);
    EXPECT_EQ(info.st_mode & 0777, 0600u);
    auto pending = PendingFile();
    const pid_t watcher = pending["owner"]["pid"];
    EXPECT_EQ(Watchers(), std::vector<pid_t>{watcher});
    // The watcher left the command's session and process group, and has no terminal.
    std::istringstream stat(Hadro::Test::Slurp("/proc/" + std::to_string(watcher) + "/stat"));
    std::string field;
    std::vector<std::string> fields;
    while (stat >> field)
        fields.push_back(field);
    ASSERT_GT(fields.size(), 7u);
    EXPECT_EQ(fields[1], "(hadro-watcher)");
    EXPECT_NE(fields[4], std::to_string(getpgrp()));
    EXPECT_NE(fields[5], std::to_string(getsid(0)));
    EXPECT_EQ(fields[6], "0");  // no controlling terminal

    while (Clock::now() - start < 1500ms) {
        ASSERT_TRUE(HasRoute("10.20.0.0/16")) << "rolled back before its time";
        std::this_thread::sleep_for(100ms);
    }
    EXPECT_TRUE(BackTo(before));
    EXPECT_GE(Clock::now() - start, 2s);
    EXPECT_FALSE(std::filesystem::exists(checkpoint_));
    EXPECT_TRUE(Eventually([&] { return Watchers().empty(); }, 3s));
}

TEST_F(CheckpointTest, AConfirmedChangeStays) {
    ASSERT_TRUE(Ok("--confirm-within=1 network ip route ipv4 add -n 10.20.0.0/16 -g 10.1.0.2"));
    ASSERT_TRUE(Ok("--confirm"));
    EXPECT_FALSE(Pending());
    // The watcher is told at once.
    EXPECT_TRUE(Eventually([&] { return Watchers().empty(); }, 2s));
    std::this_thread::sleep_for(1500ms);
    EXPECT_TRUE(HasRoute("10.20.0.0/16"));

    auto again = Hadro("--confirm");
    EXPECT_EQ(again.status, 1);
    EXPECT_EQ(again.err, "Error: No checkpoint is pending on this Linux host\n");
    auto rollback = Hadro("--rollback");
    EXPECT_EQ(rollback.status, 1);
    EXPECT_EQ(rollback.err, "Error: No checkpoint is pending on this Linux host\n");
    // A command that changes nothing takes no checkpoint, and its watcher leaves.
    ASSERT_TRUE(Ok("--confirm-within=5 network ip route ipv4 list"));
    EXPECT_FALSE(Pending());
    EXPECT_TRUE(Eventually([&] { return Watchers().empty(); }, 2s));
}

// Everything the commands change comes back, what the kernel took along included: the route
// that went with a removed address, an interface removed from its port group and one added,
// a netstack, the resolver, the firewall, IPsec policies, shaping, neighbours, tags.
TEST_F(CheckpointTest, AnExplicitRollbackRestoresEverythingAndTheKernelsSideEffects) {
    ASSERT_TRUE(Ok("network ip interface add -p pg2 -m 9000 -M 02:aa:bb:cc:dd:ee"));
    // An interface in a netstack of its own: a veth pair between two namespaces.
    ASSERT_TRUE(Ok("network vswitch standard portgroup add -v vs1 -p pg3"));
    ASSERT_TRUE(Ok("network ip interface add -p pg3 -N glidex"));
    ASSERT_TRUE(Ok("network ip interface ipv4 set -i tkn2 -t static -I 10.3.0.1 -N 255.255.255.0"));
    ASSERT_TRUE(Ok("network ip interface ipv6 set -i tkn2 -e true -r false"));
    ASSERT_TRUE(Ok("network ip interface ipv6 address add -i tkn2 -I 2001:db8:5::1/64"));
    ASSERT_TRUE(Ok("network ip interface ipv4 set -i tkn1 -t static -I 10.2.0.1 -N 255.255.255.0"));
    ASSERT_TRUE(Ok("network vswitch standard policy shaping set -v vs1 -e true -b 1000 -k 2000 -t 100"));
    Sh("ip route add 10.8.0.0/16 via 10.2.0.9 proto static");
    const json before = Steady();

    const std::string batch = dir_ + "/changes";
    std::ofstream(batch) << Lines({
        "network ip neighbor remove -v 4 -a 10.1.0.7",
        "network ip interface ipv4 set -i tkn0 -t none",  // the kernel takes 10.9.0.0/16 and 10.1.0.8 along
        "network ip interface remove -i tkn1",            // and 10.8.0.0/16 with the device
        "network ip interface remove -p pg3 -N glidex",
        "network ip interface add -p pg2",
        "network ip netstack add -N lab",
        "network ip dns server add -s 192.0.2.99",
        "network ip dns server add -s 10.9.9.9 -N lab",
        "network firewall ruleset set -r sshServer -e false",
        "network ip ipsec sp remove -n web",
        "network ip ipsec sp add -n other -s 2001:db8:2::/64 -d any -p 22 -P 0 -u tcp -A discard",
        "network vswitch standard policy shaping set -v vs1 -e false",
        "network ip interface tag add -i tkn0 -t Storage",
        "network vswitch standard set -v vs1 -m 9000",
        "network vswitch standard uplink remove -v vs1 -u e1",
        "network ip route ipv4 add -n 10.30.0.0/16 -g 192.0.2.1",
    });
    auto run = Hadro("--confirm-within=60 --batch " + batch);
    // The last line fails (no route to its gateway): the others are done all the same.
    EXPECT_EQ(Count(run.err, "line "), 1) << run.All();
    EXPECT_FALSE(HasRoute("10.9.0.0/16"));
    EXPECT_FALSE(HasRoute("10.8.0.0/16"));
    EXPECT_TRUE(Pending());
    // The checkpoint knows each end of the pair between the two netstacks by the other.
    std::map<std::string, std::string> peers;
    const json snapshot = json::parse(Hadro::Test::Slurp(checkpoint_ + "/snapshot.json"));
    for (const auto& netstack : snapshot["netstacks"]) {
        for (const auto& link : netstack["links"]) {
            if (link["name"] == "tkn2" || link["name"] == "tkn2-port")
                peers[netstack["name"].get<std::string>() + "/" + link["name"].get<std::string>()] =
                    link["peerNetstack"].get<std::string>() + "/" + link["peerName"].get<std::string>();
        }
    }
    EXPECT_EQ(peers, (std::map<std::string, std::string>{{"defaultTcpipStack/tkn2-port", "glidex/tkn2"},
                                                         {"glidex/tkn2", "defaultTcpipStack/tkn2-port"}}));

    ASSERT_TRUE(Ok("--rollback"));
    EXPECT_TRUE(BackTo(before));
    EXPECT_FALSE(std::filesystem::exists(checkpoint_));
    EXPECT_TRUE(Eventually([&] { return Watchers().empty(); }, 2s));
    EXPECT_EQ(Hadro("--rollback").status, 1);
}

TEST_F(CheckpointTest, AKilledCommandStillGetsItsRollback) {
    const json before = Steady();
    // Killed with its process group as soon as its first line has changed the host.
    int lines = -1;
    const pid_t child = StartBatch("--confirm-within=2", lines);
    ASSERT_GT(child, 0);
    ASSERT_TRUE(Send(lines, "network ip route ipv4 add -n 10.20.0.0/16 -g 10.1.0.2"));
    EXPECT_TRUE(Eventually([&] { return HasRoute("10.20.0.0/16") && Pending(); }, 5s));
    kill(-child, SIGKILL);
    int status = 0;
    waitpid(child, &status, 0);
    close(lines);
    EXPECT_TRUE(WIFSIGNALED(status));
    EXPECT_TRUE(HasRoute("10.20.0.0/16"));

    EXPECT_TRUE(BackTo(before));
    EXPECT_FALSE(Pending());
}

TEST_F(CheckpointTest, AWatcherGoneBeforeTheFirstChangeStopsIt) {
    int lines = -1;
    const pid_t child = StartBatch("--confirm-within=30", lines);
    ASSERT_GT(child, 0);
    // The first line opens the session and starts the watcher; it goes before any change.
    ASSERT_TRUE(Send(lines, "network ip route ipv4 list"));
    pid_t watcher = 0;
    ASSERT_TRUE(Eventually(
        [&] {
            for (pid_t pid : Watchers()) {
                if (Hadro::Test::Has(Hadro::Test::Slurp("/proc/" + std::to_string(pid) + "/stat"),
                                     "(hadro-watcher)"))
                    watcher = pid;
            }
            return watcher != 0;
        },
        5s));
    kill(watcher, SIGKILL);
    ASSERT_TRUE(Eventually([&] { return Watchers().size() == 1; }, 5s));  // the batch alone
    ASSERT_TRUE(Send(lines, "network ip route ipv4 add -n 10.20.0.0/16 -g 10.1.0.2"));
    close(lines);
    int status = 0;
    waitpid(child, &status, 0);
    ASSERT_TRUE(WIFEXITED(status));
    EXPECT_EQ(WEXITSTATUS(status), 1);
    const std::string err = Hadro::Test::Slurp(dir_ + "/batch.err");
    EXPECT_TRUE(Hadro::Test::Has(
        err, "Cannot take a checkpoint: its watcher is gone\nline 2: network ip route ipv4 add"))
        << err;
    EXPECT_FALSE(HasRoute("10.20.0.0/16"));
    EXPECT_FALSE(Pending());
}

TEST_F(CheckpointTest, AKilledWatcherIsReportedAtEveryRunAndRollbackStillWorks) {
    const json before = Steady();
    ASSERT_TRUE(Ok("--confirm-within=60 network ip route ipv4 add -n 10.20.0.0/16 -g 10.1.0.2"));
    const pid_t watcher = PendingFile()["owner"]["pid"];
    ASSERT_EQ(kill(watcher, SIGKILL), 0);
    ASSERT_TRUE(Eventually([&] { return Watchers().empty(); }, 3s));

    // Every run says so in one line, and goes on as usual: a read, a read by anyone, a change.
    auto read = Hadro("network ip route ipv4 list");
    EXPECT_EQ(read.status, 0);
    EXPECT_NE(read.out.find("10.20.0.0"), std::string::npos);
    EXPECT_EQ(Count(read.err, "\n"), 1) << read.err;
    EXPECT_NE(read.err.find("Warning: a checkpoint taken at "), std::string::npos) << read.err;
    EXPECT_NE(read.err.find("is pending and nothing will restore it (its watcher is gone): "
                            "'hadrocli --backend=linux --confirm' keeps the changes made since, "
                            "'hadrocli --backend=linux --rollback' undoes them"),
              std::string::npos)
        << read.err;
    EXPECT_EQ(HadroUnprivileged("network ip route ipv4 list").err, read.err);
    auto change = Hadro("network ip route ipv4 add -n 10.21.0.0/16 -g 10.1.0.2");
    EXPECT_EQ(change.status, 0);
    EXPECT_EQ(change.err, read.err);
    // A change that wants a watcher of its own is refused until the stale one is settled.
    auto guarded = Hadro("--confirm-within=5 network ip route ipv4 add -n 10.22.0.0/16 -g 10.1.0.2");
    EXPECT_EQ(guarded.status, 1);
    EXPECT_NE(guarded.err.find("either comes before a change with --confirm-within"), std::string::npos)
        << guarded.err;
    EXPECT_FALSE(HasRoute("10.22.0.0/16"));

    ASSERT_TRUE(Ok("--rollback"));
    EXPECT_TRUE(BackTo(before));
    EXPECT_TRUE(Ok("network ip route ipv4 list"));  // nothing more to report
}

TEST_F(CheckpointTest, AChangeWhileOneIsPendingJoinsIt) {
    const json before = Steady();
    ASSERT_TRUE(Ok("--confirm-within=60 network ip route ipv4 add -n 10.20.0.0/16 -g 10.1.0.2"));
    const auto first = PendingFile();
    auto second = Hadro("--confirm-within=90 network ip dns server add -s 192.0.2.77");
    EXPECT_EQ(second.status, 0);
    EXPECT_EQ(Count(second.err, "\n"), 1);
    EXPECT_NE(second.err.find("Warning: this change joins the checkpoint taken at "), std::string::npos)
        << second.err;
    EXPECT_NE(second.err.find(": unless 'hadrocli --backend=linux --confirm' runs by "), std::string::npos);
    // One checkpoint, one watcher, whose deadline is now the later one.
    EXPECT_EQ(PendingFile()["owner"], first["owner"]);
    EXPECT_GE(PendingFile()["deadline"].get<long long>(), first["deadline"].get<long long>() + 29);
    // (The second command's own watcher had nothing to watch, and left.)
    EXPECT_TRUE(Eventually([&] { return Watchers().size() == 1; }, 2s));

    ASSERT_TRUE(Ok("--rollback"));
    EXPECT_TRUE(BackTo(before));
}

TEST_F(CheckpointTest, ACheckpointThatCannotBeRestoredOrReadIsSaidSo) {
    // A device of a kind the host never makes goes while the checkpoint is pending: the rest
    // comes back, what cannot is said, and the checkpoint stays for another try.
    Sh("ip link add m1 link e1-wire type macvlan");
    ASSERT_TRUE(Ok("--confirm-within=60 network ip route ipv4 add -n 10.20.0.0/16 -g 10.1.0.2"));
    Sh("ip link del m1");
    auto rollback = Hadro("--rollback");
    EXPECT_EQ(rollback.status, 1);
    EXPECT_EQ(
        rollback.err,
        "Error: The host still differs from its checkpoint: device m1 (macvlan) is gone and cannot be made "
        "again; the checkpoint is kept: 'hadrocli --backend=linux --rollback' tries again, 'hadrocli "
        "--backend=linux --confirm' keeps the host as it is\n");
    EXPECT_FALSE(HasRoute("10.20.0.0/16"));
    EXPECT_TRUE(Pending());
    ASSERT_TRUE(Ok("--confirm"));
    EXPECT_FALSE(std::filesystem::exists(checkpoint_));

    // Damaged files: a read says so and goes on, a change and --rollback are refused naming the
    // file (exit 3), --confirm removes them.
    ASSERT_TRUE(Ok("--confirm-within=60 network ip route ipv4 add -n 10.21.0.0/16 -g 10.1.0.2"));
    std::ofstream(checkpoint_ + "/snapshot.json", std::ios::trunc) << "{\"version\": 1";
    auto damaged = Hadro("--rollback");
    EXPECT_EQ(damaged.status, 3);
    EXPECT_EQ(damaged.err, "Error: Linux host checkpoint " + checkpoint_ +
                               "/snapshot.json: the snapshot is not valid JSON\n");
    std::ofstream(checkpoint_ + "/pending.json", std::ios::trunc) << "nothing";
    const std::string warning =
        "Warning: Linux host checkpoint " + checkpoint_ +
        "/pending.json: not a JSON object: 'hadrocli --backend=linux --confirm' removes it\n";
    auto read = Hadro("network ip route ipv4 list");
    EXPECT_EQ(read.status, 0);
    EXPECT_EQ(read.err, warning);
    auto change = Hadro("network ip route ipv4 add -n 10.22.0.0/16 -g 10.1.0.2");
    EXPECT_EQ(change.status, 3);
    EXPECT_EQ(change.err,
              warning + "Error: unexpected failure in 'network ip route ipv4 add': Linux host checkpoint " +
                  checkpoint_ + "/pending.json: not a JSON object\n");
    EXPECT_FALSE(HasRoute("10.22.0.0/16"));
    EXPECT_EQ(Hadro("--rollback").status, 3);
    ASSERT_TRUE(Ok("--confirm"));
    EXPECT_FALSE(std::filesystem::exists(checkpoint_));
    EXPECT_TRUE(Ok("network ip route ipv4 list"));
}

// ---------------------------------------------------------------- atomic batches

TEST_F(CheckpointTest, AnAtomicBatchWhoseLastLineFailsLeavesTheHostAsItWas) {
    const json before = Steady();
    const std::string batch = dir_ + "/changes";
    std::ofstream(batch) << Lines({
        "network ip interface ipv4 set -i tkn0 -t none",
        "network ip netstack add -N lab",
        "network ip interface add -p pg2 -N lab",
        "network vswitch standard add -v vs2",
        "network firewall ruleset set -r sshServer -e false",
        "network ip dns server add -s 192.0.2.99",
        "network ip route ipv4 remove -n 10.99.0.0/16 -g 10.1.0.2",
    });
    auto run = Hadro("--batch " + batch + " --atomic");
    EXPECT_EQ(run.status, 1) << run.All();
    EXPECT_EQ(run.out, "");
    EXPECT_NE(run.err.find("line 7: network ip route ipv4 remove"), std::string::npos) << run.err;
    EXPECT_TRUE(BackTo(before, 3s));
    EXPECT_FALSE(std::filesystem::exists(checkpoint_));
    EXPECT_TRUE(Watchers().empty());

    // A batch that succeeds keeps its changes, and no checkpoint.
    std::ofstream(batch, std::ios::trunc)
        << Lines({"network ip netstack add -N lab", "network ip dns server add -s 192.0.2.99"});
    ASSERT_TRUE(Ok("--batch " + batch + " --atomic"));
    EXPECT_TRUE(std::filesystem::exists("/run/netns/lab"));
    EXPECT_FALSE(std::filesystem::exists(checkpoint_));

    // With --confirm-within as well, a batch that succeeds waits for its confirmation.
    std::ofstream(batch, std::ios::trunc) << Lines({"network ip netstack remove -N lab"});
    const json withLab = Steady();
    ASSERT_TRUE(Ok("--confirm-within=60 --batch " + batch + " --atomic"));
    EXPECT_FALSE(std::filesystem::exists("/run/netns/lab"));
    EXPECT_TRUE(Pending());
    ASSERT_TRUE(Ok("--rollback"));
    EXPECT_TRUE(BackTo(withLab));
}

// ---------------------------------------------------------------- refusals

TEST_F(CheckpointTest, ChangesNoCheckpointCanTakeBackAreRefused) {
    const std::string nic =
        "This change cannot be rolled back, since a checkpoint does not hold the settings of "
        "a NIC's driver (ethtool): it is refused ";
    auto guarded = Hadro("--confirm-within=30 network nic tso set -n e1 -e 0");
    EXPECT_EQ(guarded.status, 1);
    EXPECT_NE(guarded.err.find(nic + "with --confirm-within"), std::string::npos) << guarded.err;
    EXPECT_FALSE(Pending());

    std::ofstream(dir_ + "/batch") << "network nic tso set -n e1 -e 0\n";
    auto atomic = Hadro("--batch " + dir_ + "/batch --atomic");
    EXPECT_EQ(atomic.status, 1);
    EXPECT_NE(atomic.err.find(nic + "in an atomic batch"), std::string::npos) << atomic.err;

    ASSERT_TRUE(Ok("--confirm-within=30 network ip route ipv4 add -n 10.20.0.0/16 -g 10.1.0.2"));
    auto pending = Hadro("network nic tso set -n e1 -e 0");
    EXPECT_EQ(pending.status, 1);
    EXPECT_NE(pending.err.find(nic + "while a checkpoint is pending"), std::string::npos) << pending.err;
    auto sa = Hadro("network ip ipsec sa remove -a");
    EXPECT_EQ(sa.status, 1);
    EXPECT_NE(
        sa.err.find("a checkpoint does not hold the keys of IPsec security associations (the kernel never "
                    "gives them back): it is refused while a checkpoint is pending"),
        std::string::npos)
        << sa.err;
    ASSERT_TRUE(Ok("--confirm"));
}

TEST_F(CheckpointTest, TheOptionsAndTheirRefusals) {
    auto run = [&](const std::string& arguments) {
        return Try(std::string("'") + HADROCLI + "' --plugin-dir='" + HADRO_PLUGIN_DIR + "' " + arguments);
    };
    auto refused = [&](const std::string& arguments, const std::string& message) {
        auto result = run(arguments);
        EXPECT_EQ(result.status, 2) << arguments << "\n" << result.All();
        EXPECT_EQ(result.err.substr(0, result.err.find('\n')), "Error: " + message) << arguments;
        EXPECT_EQ(result.out, "");
    };
    const std::string simulated =
        " is for the Linux host (--backend=linux): the simulated host keeps no checkpoints";
    refused("--state=" + dir_ + "/host.json --confirm-within=5 network nic list",
            "option --confirm-within" + simulated);
    refused("--backend=simulated --confirm", "option --confirm" + simulated);
    refused("--backend=simulated --rollback", "option --rollback" + simulated);
    for (const char* value : {"0", "-1", "abc", "", "86401", "5s", "99999999999"}) {
        refused(std::string("--backend=linux --confirm-within=") + value + " network nic list",
                std::string("option --confirm-within needs a number of seconds from 1 to 86400, got '") +
                    value + "'");
    }
    refused("--backend=linux --confirm-within", "option --confirm-within needs a value");
    refused("--backend=linux --confirm --rollback", "options --confirm and --rollback cannot be combined");
    refused("--backend=linux --dry-run --confirm-within=5 network ip dns server add -s 10.0.0.1",
            "option --dry-run changes nothing: it cannot be combined with --confirm-within");
    refused("--backend=linux --dry-run --rollback",
            "option --dry-run changes nothing: it cannot be combined with --rollback");
    refused("--backend=linux --confirm network nic list",
            "option --confirm runs no command; 'network' cannot follow it");
    const std::string alone =
        " cannot be combined with --confirm-within, --batch, --atomic, --help, --version, "
        "--list-commands, --manual or --completion";
    refused("--backend=linux --rollback --confirm-within=5", "option --rollback" + alone);
    refused("--backend=linux --confirm --batch -", "option --confirm" + alone);
    refused("--backend=linux network ip route ipv4 list --confirm-within=5",
            "unknown option --confirm-within (global options go before the first word)");
    // A batch line takes no such option.
    std::ofstream(dir_ + "/batch") << "--confirm network nic list\n";
    auto line = run("--backend=linux --batch " + dir_ + "/batch");
    EXPECT_EQ(line.status, 2);
    EXPECT_NE(line.err.find("only --formatter and --format-param may stand before the words of a batch line"),
              std::string::npos);
    // Settling a checkpoint is a change: root's business.
    auto nobody = HadroUnprivileged("--rollback");
    EXPECT_EQ(nobody.status, 1);
    EXPECT_EQ(nobody.err, "Error: Changing the host's network needs root (CAP_NET_ADMIN)\n");
    // The help, the manual and the completion know them.
    auto help = run("--help");
    for (const char* option : {"--confirm-within=SECONDS", "--confirm ", "--rollback "})
        EXPECT_NE(help.out.find(option), std::string::npos) << option;
    EXPECT_NE(run("--completion=bash").out.find("--confirm-within\\n--confirm\\n--rollback"),
              std::string::npos);
    EXPECT_NE(run("--manual").out.find("linux.json.checkpoint"), std::string::npos);
}

}  // namespace

// Stress runs of hadrocli and hadrosim as processes on one state file.
//
//   reliability_stress concurrency --cli HADROCLI --sim HADROSIM [--writers 8] [--changes 300]
//                                  [--readers 4] [--seed N] [--dir DIR]
//     Writers change the host at once (port groups, DNS servers, firewall allowed addresses,
//     interfaces), each through its own hadrocli processes, while readers list and export it.
//     Checks: every change that reported success is in the final state and nothing else is;
//     every read succeeds and shows, for each writer, the host as it was after some prefix of
//     that writer's changes, never going back.
//
//   reliability_stress crash --cli HADROCLI --sim HADROSIM [--rounds 1000] [--seed N] [--dir DIR]
//     Each round runs one change on a large host and kills the writer with SIGKILL at a random
//     moment. Checks: the state file is byte for byte the state before the change or the state
//     the same change gives when it runs to its end (computed on a copy), a change that
//     reported success is there, and temporary files left by killed writers never disturb a
//     later run and are gone after it.
//
// Exit status 0 when everything held; the figures go to stdout.
#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <map>
#include <mutex>
#include <nlohmann/json.hpp>
#include <optional>
#include <random>
#include <set>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

extern char** environ;

namespace {

using nlohmann::json;
namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;

// ---------------------------------------------------------------- processes

struct Outcome {
    int status = -1;   // exit status; 128 + signal when killed
    bool killed = false;
    std::string out, err;
    double seconds = 0;
};

std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), {});
}

void WriteFile(const std::string& path, const std::string& text) {
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out << text;
}

// Starts program with args, its stdout and stderr going to files in scratch.
pid_t Start(const std::string& program, const std::vector<std::string>& args, const std::string& scratch) {
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 1, (scratch + ".out").c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
    posix_spawn_file_actions_addopen(&actions, 2, (scratch + ".err").c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
    std::vector<std::string> copy = args;
    std::vector<char*> argv{const_cast<char*>(program.c_str())};
    for (auto& arg : copy) argv.push_back(arg.data());
    argv.push_back(nullptr);
    pid_t pid = -1;
    if (posix_spawn(&pid, program.c_str(), &actions, nullptr, argv.data(), environ) != 0) pid = -1;
    posix_spawn_file_actions_destroy(&actions);
    return pid;
}

Outcome Finish(pid_t pid, const std::string& scratch, Clock::time_point started) {
    Outcome o;
    int status = 0;
    while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
    }
    o.seconds = std::chrono::duration<double>(Clock::now() - started).count();
    if (WIFEXITED(status)) {
        o.status = WEXITSTATUS(status);
    } else {
        o.killed = WIFSIGNALED(status) && WTERMSIG(status) == SIGKILL;
        o.status = 128 + (WIFSIGNALED(status) ? WTERMSIG(status) : 0);
    }
    o.out = ReadFile(scratch + ".out");
    o.err = ReadFile(scratch + ".err");
    return o;
}

Outcome RunProcess(const std::string& program, const std::vector<std::string>& args, const std::string& scratch) {
    auto started = Clock::now();
    pid_t pid = Start(program, args, scratch);
    if (pid < 0) return Outcome{127, false, "", "cannot start " + program, 0};
    return Finish(pid, scratch, started);
}

// ---------------------------------------------------------------- what a writer owns

// The part of the host one writer changes: its port groups (on vSwitch1), DNS servers,
// allowed addresses (ruleset webAccess) and interfaces (name -> port group).
struct Owned {
    std::set<std::string> portGroups, dnsServers, allowed;
    std::map<std::string, std::string> interfaces;
    bool operator==(const Owned& o) const {
        return portGroups == o.portGroups && dnsServers == o.dnsServers && allowed == o.allowed &&
               interfaces == o.interfaces;
    }
};

// Which names belong to writer w. Interface names tkn20.. are split into pools of 12.
struct Naming {
    static constexpr int kPool = 12;
    static std::string PortGroup(int w, int k) { return "w" + std::to_string(w) + "-pg" + std::to_string(k); }
    static std::string Dns(int w, int k) {
        return "10." + std::to_string(100 + w) + "." + std::to_string(k / 250) + "." + std::to_string(k % 250 + 1);
    }
    static std::string Allowed(int w, int k) {
        if (k % 2) {
            std::ostringstream text;
            text << "2001:db8:a" << w << ':' << std::hex << k << "::/64";
            return text.str();
        }
        return "10." + std::to_string(150 + w) + "." + std::to_string(k / 250) + "." + std::to_string(k % 250 + 1);
    }
    static std::string Interface(int w, int j) { return "tkn" + std::to_string(20 + w * kPool + j); }

    static bool IsPortGroup(int w, const std::string& name) { return name.rfind("w" + std::to_string(w) + "-pg", 0) == 0; }
    static bool IsDns(int w, const std::string& s) { return s.rfind("10." + std::to_string(100 + w) + ".", 0) == 0; }
    static bool IsAllowed(int w, const std::string& s) {
        std::ostringstream v6;
        v6 << "2001:db8:a" << w << ':';
        return s.rfind("10." + std::to_string(150 + w) + ".", 0) == 0 || s.rfind(v6.str(), 0) == 0;
    }
    static bool IsInterface(int w, const std::string& name) {
        if (name.rfind("tkn", 0) != 0) return false;
        int n = std::atoi(name.c_str() + 3);
        return n >= 20 + w * kPool && n < 20 + (w + 1) * kPool;
    }
};

// The owned part of each writer as a whole document shows it.
Owned FromDocument(const json& doc, int w) {
    Owned o;
    for (const auto& vswitch : doc.value("vswitches", json::array())) {
        for (const auto& group : vswitch.value("portGroups", json::array())) {
            if (Naming::IsPortGroup(w, group["name"])) o.portGroups.insert(group["name"].get<std::string>());
        }
    }
    for (const auto& stack : doc.value("dns", json::array())) {
        for (const auto& server : stack.value("servers", json::array())) {
            if (Naming::IsDns(w, server)) o.dnsServers.insert(server.get<std::string>());
        }
    }
    for (const auto& ruleset : doc["firewall"].value("rulesets", json::array())) {
        if (ruleset["id"] != "webAccess") continue;
        for (const auto& ip : ruleset.value("allowedIps", json::array())) {
            if (Naming::IsAllowed(w, ip)) o.allowed.insert(ip.get<std::string>());
        }
    }
    for (const auto& nic : doc.value("tknnics", json::array())) {
        if (Naming::IsInterface(w, nic["name"])) {
            o.interfaces[nic["name"]] = nic["connection"].value("portGroup", "");
        }
    }
    return o;
}

// One change a writer makes: the hadrocli words and its effect on the owned part.
struct Change {
    std::vector<std::string> words;
    std::function<void(Owned&)> apply;
    std::string Text() const {
        std::string text;
        for (const auto& w : words) text += (text.empty() ? "" : " ") + w;
        return text;
    }
};

// Picks a change that the host must accept, given what the writer owns now.
Change PickChange(int w, int& counter, const Owned& now, std::mt19937& random) {
    std::vector<std::string> freeGroups;
    std::set<std::string> usedGroups;
    for (const auto& [name, group] : now.interfaces) usedGroups.insert(group);
    for (const auto& group : now.portGroups) {
        if (!usedGroups.count(group)) freeGroups.push_back(group);
    }
    std::vector<std::string> freeNames;
    for (int j = 0; j < Naming::kPool; ++j) {
        if (!now.interfaces.count(Naming::Interface(w, j))) freeNames.push_back(Naming::Interface(w, j));
    }
    auto any = [&](const auto& container) {
        auto it = container.begin();
        std::advance(it, std::uniform_int_distribution<std::size_t>(0, container.size() - 1)(random));
        return *it;
    };
    while (true) {
        int kind = std::uniform_int_distribution<int>(0, 9)(random);
        int k = counter;
        switch (kind) {
            case 0:
            case 1: {
                ++counter;
                std::string name = Naming::PortGroup(w, k);
                return {{"network", "vswitch", "standard", "portgroup", "add", "-p", name, "-v", "vSwitch1"},
                        [name](Owned& o) { o.portGroups.insert(name); }};
            }
            case 2:
                if (freeGroups.empty()) break;
                {
                    std::string name = any(freeGroups);
                    return {{"network", "vswitch", "standard", "portgroup", "remove", "-p", name, "-v", "vSwitch1"},
                            [name](Owned& o) { o.portGroups.erase(name); }};
                }
            case 3: {
                ++counter;
                std::string server = Naming::Dns(w, k);
                return {{"network", "ip", "dns", "server", "add", "-s", server},
                        [server](Owned& o) { o.dnsServers.insert(server); }};
            }
            case 4:
                if (now.dnsServers.empty()) break;
                {
                    std::string server = any(now.dnsServers);
                    return {{"network", "ip", "dns", "server", "remove", "-s", server},
                            [server](Owned& o) { o.dnsServers.erase(server); }};
                }
            case 5: {
                ++counter;
                std::string ip = Naming::Allowed(w, k);
                return {{"network", "firewall", "ruleset", "allowedip", "add", "-r", "webAccess", "-i", ip},
                        [ip](Owned& o) { o.allowed.insert(ip); }};
            }
            case 6:
                if (now.allowed.empty()) break;
                {
                    std::string ip = any(now.allowed);
                    return {{"network", "firewall", "ruleset", "allowedip", "remove", "-r", "webAccess", "-i", ip},
                            [ip](Owned& o) { o.allowed.erase(ip); }};
                }
            case 7:
            case 8:
                if (freeGroups.empty() || freeNames.empty()) break;
                {
                    std::string name = any(freeNames), group = any(freeGroups);
                    return {{"network", "ip", "interface", "add", "-i", name, "-p", group},
                            [name, group](Owned& o) { o.interfaces[name] = group; }};
                }
            case 9:
                if (now.interfaces.empty()) break;
                {
                    std::string name = any(now.interfaces).first;
                    return {{"network", "ip", "interface", "remove", "-i", name},
                            [name](Owned& o) { o.interfaces.erase(name); }};
                }
        }
    }
}

struct Options {
    std::string cli, sim, dir;
    int writers = 8, changes = 300, readers = 4, rounds = 1000;
    unsigned seed = 0;
};

std::vector<std::string> CliArgs(const std::string& state, const std::vector<std::string>& words,
                                 const char* formatter = nullptr) {
    std::vector<std::string> args{"--state=" + state};
    if (formatter) args.push_back(formatter);
    args.insert(args.end(), words.begin(), words.end());
    return args;
}

// ---------------------------------------------------------------- concurrency

// What a reader saw: by whom (reader, in order), which kind of listing, each writer's part.
struct Observation {
    int kind = 0;  // 0 export (every part), 1 port groups, 2 DNS servers, 3 allowed, 4 interfaces
    std::vector<Owned> owned;
};

bool Matches(int kind, const Owned& seen, const Owned& state) {
    switch (kind) {
        case 1: return seen.portGroups == state.portGroups;
        case 2: return seen.dnsServers == state.dnsServers;
        case 3: return seen.allowed == state.allowed;
        case 4: return seen.interfaces == state.interfaces;
        default: return seen == state;
    }
}

// The owned parts a listing shows (only the kind it lists is filled in).
std::optional<std::vector<Owned>> FromListing(int kind, const json& out, int writers) {
    std::vector<Owned> owned(writers);
    for (int w = 0; w < writers; ++w) {
        Owned& o = owned[w];
        if (kind == 1) {
            for (const auto& g : out) {
                if (Naming::IsPortGroup(w, g["Name"])) o.portGroups.insert(g["Name"].get<std::string>());
            }
        } else if (kind == 2) {
            for (const auto& s : out["DNS Servers"]) {
                if (Naming::IsDns(w, s)) o.dnsServers.insert(s.get<std::string>());
            }
        } else if (kind == 3) {
            for (const auto& r : out) {
                if (r["Ruleset"] != "webAccess") continue;
                for (const auto& ip : r["Allowed IP Addresses"]) {
                    if (Naming::IsAllowed(w, ip)) o.allowed.insert(ip.get<std::string>());
                }
            }
        } else if (kind == 4) {
            for (const auto& nic : out) {
                if (Naming::IsInterface(w, nic["Name"])) o.interfaces[nic["Name"]] = nic["Portgroup"];
            }
        }
    }
    return owned;
}

int Concurrency(const Options& opt) {
    const std::string state = opt.dir + "/host.json";
    const std::string scratch = opt.dir + "/scratch";
    fs::create_directories(scratch);
    if (RunProcess(opt.sim, {"--state=" + state, "reset"}, scratch + "/reset").status != 0) {
        std::cerr << "cannot reset the host\n";
        return 1;
    }
    json initial = json::parse(ReadFile(state));

    std::vector<std::vector<Owned>> histories(opt.writers);
    std::vector<std::vector<std::string>> writerFaults(opt.writers);
    std::atomic<int> writersLeft{opt.writers};
    std::vector<std::thread> threads;
    auto started = Clock::now();
    for (int w = 0; w < opt.writers; ++w) {
        threads.emplace_back([&, w] {
            std::mt19937 random(opt.seed * 1000 + static_cast<unsigned>(w));
            Owned now;
            histories[w].push_back(now);
            int counter = 0;
            const std::string mine = scratch + "/w" + std::to_string(w);
            for (int i = 0; i < opt.changes; ++i) {
                Change change = PickChange(w, counter, now, random);
                auto r = RunProcess(opt.cli, CliArgs(state, change.words), mine);
                if (r.status == 0 && r.err.empty()) {
                    change.apply(now);
                    histories[w].push_back(now);
                } else {
                    writerFaults[w].push_back(change.Text() + " -> " + std::to_string(r.status) + ": " + r.err);
                }
            }
            --writersLeft;
        });
    }

    std::vector<std::vector<Observation>> observations(opt.readers);
    std::vector<std::vector<std::string>> readerFaults(opt.readers);
    for (int rd = 0; rd < opt.readers; ++rd) {
        threads.emplace_back([&, rd] {
            const std::string mine = scratch + "/r" + std::to_string(rd);
            static const std::vector<std::vector<std::string>> listings = {
                {},
                {"network", "vswitch", "standard", "portgroup", "list"},
                {"network", "ip", "dns", "server", "list"},
                {"network", "firewall", "ruleset", "allowedip", "list"},
                {"network", "ip", "interface", "list"},
            };
            for (int n = 0; writersLeft > 0; ++n) {
                int kind = (n + rd) % 5;
                Outcome r = kind == 0 ? RunProcess(opt.sim, {"--state=" + state, "export"}, mine)
                                      : RunProcess(opt.cli, CliArgs(state, listings[kind], "--formatter=json"), mine);
                if (r.status != 0 || !r.err.empty()) {
                    readerFaults[rd].push_back("read " + std::to_string(kind) + " failed with " +
                                               std::to_string(r.status) + ": " + r.err);
                    continue;
                }
                try {
                    json doc = json::parse(r.out);
                    Observation o{kind, {}};
                    if (kind == 0) {
                        for (int w = 0; w < opt.writers; ++w) o.owned.push_back(FromDocument(doc, w));
                    } else {
                        o.owned = *FromListing(kind, doc, opt.writers);
                    }
                    observations[rd].push_back(std::move(o));
                } catch (const std::exception& e) {
                    readerFaults[rd].push_back("read " + std::to_string(kind) + " gave output that does not parse: " +
                                               e.what());
                }
            }
        });
    }
    for (auto& t : threads) t.join();
    double seconds = std::chrono::duration<double>(Clock::now() - started).count();

    int faults = 0;
    auto fault = [&](const std::string& text) {
        if (++faults <= 20) std::cout << "FAULT: " << text << '\n';
    };
    int succeeded = 0;
    for (int w = 0; w < opt.writers; ++w) {
        succeeded += static_cast<int>(histories[w].size()) - 1;
        for (const auto& f : writerFaults[w]) fault("writer " + std::to_string(w) + ": " + f);
    }
    int reads = 0;
    for (int rd = 0; rd < opt.readers; ++rd) {
        for (const auto& f : readerFaults[rd]) fault("reader " + std::to_string(rd) + ": " + f);
        // A reader sees each writer's changes as a prefix that only grows.
        std::vector<std::size_t> at(opt.writers, 0);
        for (std::size_t n = 0; n < observations[rd].size(); ++n) {
            const auto& o = observations[rd][n];
            ++reads;
            for (int w = 0; w < opt.writers; ++w) {
                std::size_t j = at[w];
                while (j < histories[w].size() && !Matches(o.kind, o.owned[w], histories[w][j])) ++j;
                if (j == histories[w].size()) {
                    fault("reader " + std::to_string(rd) + " read " + std::to_string(n) + " (kind " +
                          std::to_string(o.kind) + ") shows writer " + std::to_string(w) +
                          " in a state it never committed, or going back");
                } else {
                    at[w] = j;
                }
            }
        }
    }

    // The final state: each writer's last committed part, and nothing else of theirs or anyone's.
    auto final = RunProcess(opt.sim, {"--state=" + state, "export"}, scratch + "/final");
    if (final.status != 0) {
        fault("the final state does not load: " + final.err);
    } else {
        json doc = json::parse(final.out);
        for (int w = 0; w < opt.writers; ++w) {
            if (!(FromDocument(doc, w) == histories[w].back())) {
                fault("writer " + std::to_string(w) + ": the final state differs from its committed changes");
            }
        }
        // Strip every writer's part from both documents: what is left is the untouched host.
        auto strip = [&](json d) {
            for (auto& vswitch : d["vswitches"]) {
                auto& groups = vswitch["portGroups"];
                json kept = json::array();
                for (const auto& g : groups) {
                    bool owned = false;
                    for (int w = 0; w < opt.writers; ++w) owned = owned || Naming::IsPortGroup(w, g["name"]);
                    if (!owned) kept.push_back(g);
                }
                groups = kept;
                vswitch.erase("usedPorts");
            }
            for (auto& stack : d["dns"]) {
                json kept = json::array();
                for (const auto& s : stack["servers"]) {
                    bool owned = false;
                    for (int w = 0; w < opt.writers; ++w) owned = owned || Naming::IsDns(w, s);
                    if (!owned) kept.push_back(s);
                }
                stack["servers"] = kept;
            }
            for (auto& ruleset : d["firewall"]["rulesets"]) {
                json kept = json::array();
                for (const auto& ip : ruleset["allowedIps"]) {
                    bool owned = false;
                    for (int w = 0; w < opt.writers; ++w) owned = owned || Naming::IsAllowed(w, ip);
                    if (!owned) kept.push_back(ip);
                }
                ruleset["allowedIps"] = kept;
            }
            json nics = json::array();
            for (const auto& nic : d["tknnics"]) {
                bool owned = false;
                for (int w = 0; w < opt.writers; ++w) owned = owned || Naming::IsInterface(w, nic["name"]);
                if (!owned) nics.push_back(nic);
            }
            d["tknnics"] = nics;
            d.erase("ports");    // an interface takes a port of its switch
            d.erase("digests");  // they follow the sections
            return d;
        };
        if (strip(doc) != strip(initial)) fault("the final state holds changes that no writer reported");
    }

    std::cout << "concurrency: " << opt.writers << " writers x " << opt.changes << " changes, " << opt.readers
              << " readers: " << succeeded << " changes committed, " << reads << " reads checked, in "
              << static_cast<int>(seconds) << " s; " << faults << " faults\n";
    return faults == 0 ? 0 : 1;
}

// ---------------------------------------------------------------- crash

// The default host with many connections: about a megabyte, so that writing it takes a
// while and kills land inside the write.
std::string LargeHost(const std::string& defaultHost) {
    json doc = json::parse(defaultHost);
    for (auto& stack : doc["connections"]) {
        if (stack["connections"].empty()) continue;
        json first = stack["connections"][0];
        for (int i = 0; i < 6000; ++i) stack["connections"].push_back(first);
        break;
    }
    return doc.dump();
}

std::vector<std::string> Leftovers(const std::string& dir) {
    std::vector<std::string> names;
    for (const auto& entry : fs::directory_iterator(dir)) {
        std::string name = entry.path().filename().string();
        if (name != "host.json" && name != "host.json.lock") names.push_back(name);
    }
    return names;
}

int Crash(const Options& opt) {
    const std::string live = opt.dir + "/live", ref = opt.dir + "/ref", scratch = opt.dir + "/scratch";
    for (const auto& d : {live, ref, scratch}) fs::create_directories(d);
    const std::string state = live + "/host.json", refState = ref + "/host.json";
    auto reset = RunProcess(opt.sim, {"--state=" + state, "reset"}, scratch + "/setup");
    WriteFile(scratch + "/large.json", LargeHost(ReadFile(state)));
    auto imported = RunProcess(opt.sim, {"--state=" + state, "import", scratch + "/large.json"}, scratch + "/setup");
    if (reset.status != 0 || imported.status != 0) {
        std::cerr << "cannot set up the host: " << reset.err << imported.err << '\n';
        return 1;
    }

    std::mt19937 random(opt.seed);
    Owned now;
    int counter = 0;
    int faults = 0, killedBefore = 0, killedAfter = 0, finished = 0, leftTemp = 0;
    double average = 0;
    auto fault = [&](const std::string& text) {
        if (++faults <= 20) std::cout << "FAULT: " << text << '\n';
    };
    auto started = Clock::now();
    for (int round = 0; round < opt.rounds; ++round) {
        std::string before = ReadFile(state);
        Change change = PickChange(0, counter, now, random);

        // The state this change commits, from an uninterrupted run on a copy.
        WriteFile(refState, before);
        auto full = RunProcess(opt.cli, CliArgs(refState, change.words), scratch + "/ref");
        if (full.status != 0) {
            fault("round " + std::to_string(round) + ": " + change.Text() + " failed: " + full.err);
            continue;
        }
        std::string after = ReadFile(refState);
        average = round == 0 ? full.seconds : average * 0.9 + full.seconds * 0.1;

        // The same change on the live state, killed at a random moment of its run.
        auto begun = Clock::now();
        pid_t pid = Start(opt.cli, CliArgs(state, change.words), scratch + "/live");
        double delay = std::uniform_real_distribution<double>(0, average * 1.1)(random);
        timespec pause{static_cast<time_t>(delay), static_cast<long>((delay - static_cast<long>(delay)) * 1e9)};
        nanosleep(&pause, nullptr);
        kill(pid, SIGKILL);
        auto outcome = Finish(pid, scratch + "/live", begun);

        std::string result = ReadFile(state);
        bool isBefore = result == before, isAfter = result == after;
        if (!outcome.killed) {
            ++finished;
            if (outcome.status != 0) fault("round " + std::to_string(round) + ": exited " +
                                           std::to_string(outcome.status) + ": " + outcome.err);
            if (!isAfter) fault("round " + std::to_string(round) + ": reported success, but the change is not there");
        } else if (isAfter && !isBefore) {
            ++killedAfter;
        } else if (isBefore) {
            ++killedBefore;
        } else {
            fault("round " + std::to_string(round) + ": the state file is neither the old nor the new state (" +
                  std::to_string(result.size()) + " bytes)");
            WriteFile(state, before);  // go on from a known state
        }
        if (ReadFile(state) == after) change.apply(now);
        if (!Leftovers(live).empty()) ++leftTemp;
        if (round % 100 == 99) {
            auto check = RunProcess(opt.sim, {"--state=" + state, "export"}, scratch + "/check");
            if (check.status != 0) fault("round " + std::to_string(round) + ": the state does not load: " + check.err);
        }
    }

    // One more change that runs to its end: it must not trip over anything left behind, and
    // it clears what killed writers left.
    Change last = PickChange(0, counter, now, random);
    auto r = RunProcess(opt.cli, CliArgs(state, last.words), scratch + "/last");
    if (r.status != 0) fault("the run after the kills failed: " + r.err);
    for (const auto& name : Leftovers(live)) fault("left behind after a later run: " + name);
    auto check = RunProcess(opt.sim, {"--state=" + state, "export"}, scratch + "/check");
    if (check.status != 0) fault("the final state does not load: " + check.err);
    last.apply(now);
    if (check.status == 0 && !(FromDocument(json::parse(check.out), 0) == now))
        fault("the final state differs from the committed changes");

    double seconds = std::chrono::duration<double>(Clock::now() - started).count();
    std::cout << "crash: " << opt.rounds << " rounds in " << static_cast<int>(seconds) << " s (a change takes "
              << static_cast<int>(average * 1000) << " ms): " << killedBefore << " killed before commit, "
              << killedAfter << " killed after commit, " << finished << " finished first; " << leftTemp
              << " kills left a temporary file (cleared by the next writer); " << faults << " faults\n";
    return faults == 0 ? 0 : 1;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 2) {
        std::cerr << "usage: reliability_stress concurrency|crash --cli PATH --sim PATH [options]\n";
        return 2;
    }
    std::string mode = argv[1];
    Options opt;
    opt.seed = static_cast<unsigned>(std::random_device{}());
    for (int i = 2; i + 1 < argc; i += 2) {
        std::string name = argv[i], value = argv[i + 1];
        if (name == "--cli") opt.cli = value;
        else if (name == "--sim") opt.sim = value;
        else if (name == "--dir") opt.dir = value;
        else if (name == "--writers") opt.writers = std::stoi(value);
        else if (name == "--changes") opt.changes = std::stoi(value);
        else if (name == "--readers") opt.readers = std::stoi(value);
        else if (name == "--rounds") opt.rounds = std::stoi(value);
        else if (name == "--seed") opt.seed = static_cast<unsigned>(std::stoul(value));
        else {
            std::cerr << "unknown option " << name << '\n';
            return 2;
        }
    }
    if (opt.cli.empty() || opt.sim.empty()) {
        std::cerr << "--cli and --sim are needed\n";
        return 2;
    }
    bool own = opt.dir.empty();
    if (own) {
        char pattern[] = "/tmp/hadro-stress-XXXXXX";
        opt.dir = mkdtemp(pattern);
    }
    std::cout << mode << ": seed " << opt.seed << ", in " << opt.dir << '\n';
    int status = 2;
    if (mode == "concurrency") status = Concurrency(opt);
    else if (mode == "crash") status = Crash(opt);
    else std::cerr << "unknown mode " << mode << '\n';
    if (own && status == 0) fs::remove_all(opt.dir);
    return status;
}

// The netstacks of the Linux host, its IPv6 switch and its connections.
//
// A netstack is a network namespace: the default one is the namespace the program runs in,
// the others are the named namespaces of /run/netns. Its maximum number of connections is the
// namespace's net.core.somaxconn, its congestion-control algorithm net.ipv4.
// tcp_congestion_control, its IPv6 switch net.ipv6.conf.{all,default}.disable_ipv6; all three
// take effect at once, so a netstack's configured and current values are the same while it is
// enabled. A netstack added disabled lives in the host's document with its settings until it
// is enabled: then its namespace is made with them.
//
// The host's IPv6 switch ("network ip get") is that of the default netstack; "network ip set"
// switches IPv6 in every netstack the kernel has.
//
// Connections are the sockets sock_diag reports in the netstack's namespace; a socket's world
// is the process (lowest PID) that holds it open, 0 when none can be seen.
#include "network/netstack.h"

#include <algorithm>
#include <charconv>
#include <memory>
#include <set>
#include <sstream>
#include <stdexcept>
#include <vector>

#include <nlohmann/json.hpp>

#include "backend/netstacks.h"
#include "core/context.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "kernel/links.h"
#include "kernel/namespaces.h"
#include "kernel/processes.h"
#include "kernel/sockets.h"
#include "kernel/sysctl.h"
#include "network/areas.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;
using nlohmann::json;

// ---------------------------------------------------------------- the document and names

NetstackRecords ParseNetstackRecords(const json& member) {
    NetstackRecords records;
    if (member.is_null()) return records;
    if (!member.is_object()) throw std::invalid_argument("not an object");
    for (const auto& [name, value] : member.items()) {
        const std::string& key = name;  // a lambda below captures it: clang 14 cannot capture a binding
        auto fault = [&](const std::string& what) {
            return std::invalid_argument(Lib::Quote(key) + ": " + what);
        };
        if (!Kernel::IsNamespaceName(key)) throw fault("no name a namespace can have");
        if (!value.is_object()) throw fault("not an object");
        NetstackRecord record;
        for (const auto& [field, item] : value.items()) {
            if (field == "name" && item.is_string()) {
                record.name = item.get<std::string>();
            } else if (field == "disabled" && item.is_boolean()) {
                record.disabled = item.get<bool>();
            } else if (field == "maxConnections" && item.is_number_unsigned() &&
                       item.get<std::uint64_t>() <= UINT32_MAX) {
                record.maxConnections = item.get<std::uint32_t>();
            } else if (field == "congestionControl" && item.is_string() && !item.get<std::string>().empty()) {
                record.congestionControl = item.get<std::string>();
            } else if (field == "ipv6Enabled" && item.is_boolean()) {
                record.ipv6Enabled = item.get<bool>();
            } else {
                throw fault("member " + Lib::Quote(field) + " is unknown or of the wrong type");
            }
        }
        if (record.disabled && (!value.contains("maxConnections") || !value.contains("congestionControl") ||
                                !value.contains("ipv6Enabled"))) {
            throw fault("a disabled netstack needs maxConnections, congestionControl and ipv6Enabled");
        }
        records.emplace(key, std::move(record));
    }
    return records;
}

json NetstackRecordsJson(const NetstackRecords& records) {
    json member = json::object();
    for (const auto& [key, record] : records) {
        if (record.name.empty() && !record.disabled) continue;  // nothing the kernel does not hold
        json value = json::object();
        if (!record.name.empty()) value["name"] = record.name;
        if (record.disabled) {
            value["disabled"] = true;
            value["maxConnections"] = record.maxConnections;
            value["congestionControl"] = record.congestionControl;
            value["ipv6Enabled"] = record.ipv6Enabled;
        }
        member[key] = std::move(value);
    }
    return member;
}

std::string KernelAlgorithm(const std::string& hostName) {
    return hostName == "newreno" ? "reno" : hostName;
}

std::string HostAlgorithm(const std::string& kernelName) {
    return kernelName == "reno" ? "newreno" : kernelName;
}

namespace {

std::vector<std::string> Words(const std::string& text) {
    std::istringstream in(text);
    std::vector<std::string> words;
    for (std::string word; in >> word;)
        words.push_back(word);
    return words;
}

bool Holds(const std::string& list, const std::string& word) {
    auto words = Words(list);
    return std::find(words.begin(), words.end(), word) != words.end();
}

}  // namespace

std::string HostAlgorithmList(const std::string& kernelList) {
    std::string out;
    for (const auto& word : Words(kernelList))
        out += (out.empty() ? "" : ", ") + HostAlgorithm(word);
    return out.empty() ? "none" : out;
}

std::string AlgorithmRefusal(const std::string& netstack, const std::string& algorithm,
                             const std::string& allowed, const std::string& available) {
    std::string kernelName = KernelAlgorithm(algorithm);
    if (!Holds(available, kernelName)) {
        return "Congestion-control algorithm " + Lib::Quote(algorithm) +
               " is not available in the kernel, which offers " + HostAlgorithmList(available) +
               " (net.ipv4.tcp_available_congestion_control)";
    }
    if (!Holds(allowed, kernelName)) {
        return "Congestion-control algorithm " + Lib::Quote(algorithm) +
               " is not allowed in netstack instance " + Lib::Quote(netstack) + ": the kernel allows " +
               HostAlgorithmList(allowed) + " there (net.ipv4.tcp_allowed_congestion_control)";
    }
    return {};
}

// ---------------------------------------------------------------- the area

namespace {

constexpr const char* kMember = "netstacks";
constexpr const char* kSomaxconn = "core/somaxconn";
constexpr const char* kAlgorithm = "ipv4/tcp_congestion_control";
constexpr const char* kAllowed = "ipv4/tcp_allowed_congestion_control";
constexpr const char* kAvailable = "ipv4/tcp_available_congestion_control";
constexpr const char* kIpv6All = "ipv6/conf/all/disable_ipv6";
constexpr const char* kIpv6Default = "ipv6/conf/default/disable_ipv6";

// Devices every new namespace gets from the tunnel drivers loaded (their fallback devices):
// they go with the namespace and are nobody's interfaces.
bool IsNamespaceDevice(const Kernel::Link& link) {
    static const std::pair<const char*, const char*> kFallbacks[] = {
        {"ipip", "tunl0"},           {"gre", "gre0"},    {"gretap", "gretap0"},
        {"erspan", "erspan0"},       {"sit", "sit0"},    {"ip6tnl", "ip6tnl0"},
        {"ip6gre", "ip6gre0"},       {"vti", "ip_vti0"}, {"vti6", "ip6_vti0"},
        {"ip6erspan", "ip6erspan0"},
    };
    if (link.loopback || link.name == "lo") return true;
    for (const auto& [kind, name] : kFallbacks) {
        if (link.kind == kind && link.name == name) return true;
    }
    return false;
}

std::uint32_t HostTcpState(int kernelState) {
    // The host's indices: 0 CLOSED, 1 LISTEN, 2 SYN_SENT, 3 SYN_RCVD, 4 ESTABLISHED,
    // 5 CLOSE_WAIT, 6 FIN_WAIT_1, 7 CLOSING, 8 LAST_ACK, 9 FIN_WAIT_2, 10 TIME_WAIT.
    switch (kernelState) {
        case Kernel::kTcpEstablished:
            return 4;
        case Kernel::kTcpSynSent:
            return 2;
        case Kernel::kTcpSynRecv:
        case Kernel::kTcpNewSynRecv:
            return 3;
        case Kernel::kTcpFinWait1:
            return 6;
        case Kernel::kTcpFinWait2:
            return 9;
        case Kernel::kTcpTimeWait:
            return 10;
        case Kernel::kTcpClose:
            return 0;
        case Kernel::kTcpCloseWait:
            return 5;
        case Kernel::kTcpLastAck:
            return 8;
        case Kernel::kTcpListen:
            return 1;
        case Kernel::kTcpClosing:
            return 7;
        default:
            return 11;  // no state the host names
    }
}

[[noreturn]] void NoSuchNetstack(const std::string& key) {
    throw HostCtlException("Netstack instance " + Lib::Quote(key) + " does not exist");
}

std::string Setting(const char* name) {
    return std::string("net.") + name;
}

class LinuxNetstacks final : public Backend::Netstacks {
public:
    explicit LinuxNetstacks(Context& context) : context_(context) {}

    std::vector<Backend::NetstackEntry> List() override {
        auto records = Records();
        std::vector<Backend::NetstackEntry> list;
        std::set<std::string> named;
        for (const auto& key : context_.Netstacks()) {
            if (key != Context::kDefaultNetstack) named.insert(key);
        }
        for (const auto& [key, record] : records) {
            if (record.disabled && key != Context::kDefaultNetstack) named.insert(key);
        }
        list.push_back(*Entry(Context::kDefaultNetstack, records));
        for (const auto& key : named) {
            if (auto entry = Entry(key, records)) list.push_back(std::move(*entry));
        }
        return list;
    }

    std::optional<Backend::NetstackEntry> Find(const std::string& key) override {
        return Entry(key, Records());
    }

    Backend::NetstackSettings ReadSettings(const std::string& key) override {
        auto entry = Require(key);
        Backend::NetstackSettings settings;
        if (!entry.enabled) {
            auto records = Records();
            const auto& record = Disabled(records, key);
            settings.maxConnections = record.maxConnections;
            settings.congestionControl = record.congestionControl;
            settings.ipv6Enabled = record.ipv6Enabled;
            return settings;
        }
        auto ns = context_.NamespaceOf(key);
        settings.maxConnections = settings.currentMaxConnections = ReadNumber(ns, kSomaxconn);
        settings.congestionControl = HostAlgorithm(ReadText(ns, kAlgorithm));
        settings.ipv6Enabled = settings.currentIpv6Enabled = Ipv6On(ns);
        return settings;
    }

    void Add(const std::string& key, const std::string& name, const Backend::NetstackSettings& settings,
             bool disabled) override {
        context_.BeginChange();
        auto records = Records();
        NetstackRecord record;
        record.name = name == key ? std::string() : name;
        if (disabled) {
            // The namespace will be made with these: refuse now what the kernel would then.
            if (std::string why = Refusal(key, settings.congestionControl); !why.empty())
                throw HostCtlException(why);
            record.disabled = true;
            record.maxConnections = settings.maxConnections;
            record.congestionControl = settings.congestionControl;
            record.ipv6Enabled = settings.ipv6Enabled;
        } else {
            Create(key, settings);
        }
        records[key] = record;
        Store(records);
    }

    void Remove(const std::string& key, bool /*force: the same rules hold either way*/) override {
        auto entry = Require(key);
        context_.BeginChange();
        if (entry.enabled) {
            RefuseWhileInUse(key, "removed");
            Kernel::DeleteNamedNamespace(key);
            Check(Kernel::DryRun() || !Kernel::NamedNamespaceExists(key),
                  "Network namespace " + key + " is still there after its removal");
            if (!Kernel::RemoveNamespaceFiles(key)) {
                context_.Warn(std::string(Kernel::kNamespaceFiles) + "/" + key +
                              " is kept: it holds files other than resolv.conf");
            }
        }
        auto records = Records();
        records.erase(key);
        Store(records);
    }

    void SetName(const std::string& key, const std::string& name) override {
        Require(key);
        context_.BeginChange();
        auto records = Records();
        auto& record = records[key];
        record.name = name == key ? std::string() : name;
        Store(records);
    }

    void SetMaxConnections(const std::string& key, std::uint32_t maxConnections) override {
        auto entry = Require(key);
        context_.BeginChange();
        if (!entry.enabled) {
            return ChangeRecord(key, [&](NetstackRecord& record) { record.maxConnections = maxConnections; });
        }
        auto ns = context_.NamespaceOf(key);
        if (ReadNumber(ns, kSomaxconn) != maxConnections) ApplyMaxConnections(ns, key, maxConnections);
    }

    void SetCongestionControl(const std::string& key, const std::string& algorithm) override {
        auto entry = Require(key);
        context_.BeginChange();
        if (!entry.enabled) {
            if (std::string why = Refusal(key, algorithm); !why.empty()) throw HostCtlException(why);
            return ChangeRecord(key, [&](NetstackRecord& record) { record.congestionControl = algorithm; });
        }
        auto ns = context_.NamespaceOf(key);
        if (ReadText(ns, kAlgorithm) != KernelAlgorithm(algorithm)) ApplyAlgorithm(ns, key, algorithm);
    }

    void SetIpv6Enabled(const std::string& key, bool enabled) override {
        auto entry = Require(key);
        context_.BeginChange();
        if (!entry.enabled) {
            return ChangeRecord(key, [&](NetstackRecord& record) { record.ipv6Enabled = enabled; });
        }
        auto ns = context_.NamespaceOf(key);
        if (Ipv6On(ns) != enabled) ApplyIpv6(ns, key, enabled);
    }

    void Enable(const std::string& key) override {
        auto entry = Require(key);
        context_.BeginChange();
        if (entry.enabled) return;
        auto records = Records();
        auto& record = Disabled(records, key);
        Backend::NetstackSettings settings;
        settings.maxConnections = record.maxConnections;
        settings.congestionControl = record.congestionControl;
        settings.ipv6Enabled = record.ipv6Enabled;
        Create(key, settings);
        records[key] = NetstackRecord{record.name, false, 0, {}, false};
        Store(records);
    }

    void Disable(const std::string& key) override {
        auto entry = Require(key);
        context_.BeginChange();
        if (!entry.enabled) return;
        RefuseWhileInUse(key, "disabled");
        auto settings = ReadSettings(key);
        auto records = Records();
        NetstackRecord record;
        record.name = records.count(key) ? records[key].name : std::string();
        record.disabled = true;
        record.maxConnections = settings.maxConnections;
        record.congestionControl = settings.congestionControl;
        record.ipv6Enabled = settings.ipv6Enabled;
        Kernel::DeleteNamedNamespace(key);
        Check(Kernel::DryRun() || !Kernel::NamedNamespaceExists(key),
              "Network namespace " + key + " is still there after its removal");
        records[key] = record;
        Store(records);
    }

    bool IsIpv6Enabled() override { return Ipv6On(Kernel::Namespace::Own()); }

    void SetIpv6EnabledEverywhere(bool enabled) override {
        context_.BeginChange();
        for (const auto& key : context_.Netstacks()) {
            auto ns = context_.NamespaceOf(key);
            if (Ipv6On(ns) != enabled) ApplyIpv6(ns, key, enabled);
        }
    }

    std::vector<HostCtl::Network::TcpIpConnection> Connections(const std::string& netstack,
                                                               Backend::ConnectionClass kind) override {
        auto entry = Require(netstack);
        std::vector<HostCtl::Network::TcpIpConnection> out;
        seen_.clear();
        if (!entry.enabled) return out;  // no namespace: no sockets
        auto sockets = Kernel::ListSockets(context_.NamespaceOf(netstack), KernelKind(kind));
        std::set<std::uint64_t> inodes;
        for (const auto& socket : sockets) {
            if (socket.inode != 0) inodes.insert(socket.inode);
        }
        auto owners = Kernel::SocketOwners(inodes);
        out.reserve(sockets.size());
        for (const auto& socket : sockets) {
            HostCtl::Network::TcpIpConnection c;
            c.recvQ = socket.receiveQueue;
            c.sendQ = socket.sendQueue;
            c.localAddress = socket.localAddress;
            c.localPort = socket.localPort;
            c.foreignAddress = socket.remoteAddress;
            c.foreignPort = socket.remotePort;
            c.state = HostTcpState(socket.state);
            c.ccAlgo = HostAlgorithm(socket.congestionControl);
            if (auto owner = owners.find(socket.inode); socket.inode != 0 && owner != owners.end()) {
                c.worldId = owner->second.pid;
                seen_[owner->second.pid] = owner->second.name;
            }
            out.push_back(std::move(c));
        }
        return out;
    }

    std::string WorldName(std::uint32_t worldId) override {
        if (worldId == 0) return {};
        // The name the process had when its sockets were listed, should it have ended since.
        if (auto it = seen_.find(worldId); it != seen_.end()) return it->second;
        if (auto name = Kernel::ProcessName(worldId)) return *name;
        throw HostCtlException("World " + std::to_string(worldId) + " does not exist");
    }

private:
    NetstackRecords Records() {
        try {
            return ParseNetstackRecords(context_.GetDocument().Read(kMember));
        } catch (const std::invalid_argument& fault) {
            context_.GetDocument().Refuse(kMember, fault.what());
        }
    }

    void Store(const NetstackRecords& records) {
        const json& current = context_.GetDocument().Read(kMember);
        json wanted = NetstackRecordsJson(records);
        if (current == wanted || (current.is_null() && records.empty())) return;
        context_.GetDocument().Write(kMember) = std::move(wanted);
    }

    template <class Change>
    void ChangeRecord(const std::string& key, Change change) {
        auto records = Records();
        change(Disabled(records, key));
        Store(records);
    }

    // The record of a netstack kept disabled (read again once the document is locked).
    static NetstackRecord& Disabled(NetstackRecords& records, const std::string& key) {
        auto it = records.find(key);
        if (it == records.end() || !it->second.disabled) NoSuchNetstack(key);
        return it->second;
    }

    std::optional<Backend::NetstackEntry> Entry(const std::string& key, const NetstackRecords& records) {
        if (key.empty()) return std::nullopt;
        auto record = records.find(key);
        Backend::NetstackEntry entry{key, key, false};
        if (record != records.end() && !record->second.name.empty()) entry.name = record->second.name;
        if (key == Context::kDefaultNetstack || Kernel::NamedNamespaceExists(key)) {
            entry.enabled = true;
            return entry;
        }
        if (record != records.end() && record->second.disabled) return entry;
        return std::nullopt;
    }

    Backend::NetstackEntry Require(const std::string& key) {
        auto entry = Find(key);
        if (!entry) NoSuchNetstack(key);
        return *entry;
    }

    static void Check(bool ok, const std::string& message) {
        if (!ok) throw HostCtlException(message);
    }

    static std::string ReadText(const Kernel::Namespace& ns, const char* name) {
        auto value = Kernel::ReadSysctl(ns, name);
        if (!value) throw HostCtlException("The kernel has no setting " + Setting(name));
        return *value;
    }

    static std::uint32_t ReadNumber(const Kernel::Namespace& ns, const char* name) {
        std::string text = ReadText(ns, name);
        std::int64_t value = -1;
        auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
        if (error != std::errc() || end != text.data() + text.size() || value < 0 || value > UINT32_MAX)
            throw HostCtlException("The kernel setting " + Setting(name) +
                                   " holds no count: " + Lib::Quote(text));
        return static_cast<std::uint32_t>(value);
    }

    // IPv6 is on when neither the interfaces there nor those to come disable it; off where
    // the kernel has no IPv6.
    static bool Ipv6On(const Kernel::Namespace& ns) {
        auto all = Kernel::ReadSysctl(ns, kIpv6All);
        auto fresh = Kernel::ReadSysctl(ns, kIpv6Default);
        return all && fresh && *all == "0" && *fresh == "0";
    }

    static bool HasIpv6(const Kernel::Namespace& ns) { return Kernel::ReadSysctl(ns, kIpv6All).has_value(); }

    // Why the kernel would bar the algorithm in a namespace other than the program's, or empty.
    std::string Refusal(const std::string& key, const std::string& algorithm) {
        auto own = Kernel::Namespace::Own();
        return AlgorithmRefusal(key, algorithm, Kernel::ReadSysctl(own, kAllowed).value_or(""),
                                Kernel::ReadSysctl(own, kAvailable).value_or(""));
    }

    // Makes the namespace of a netstack with its settings; a namespace that cannot take them
    // goes again.
    void Create(const std::string& key, const Backend::NetstackSettings& settings) {
        Kernel::AddNamedNamespace(key);
        auto ns = Kernel::Namespace::Named(key);
        if (Kernel::DryRun()) return CreateDryRun(key, ns, settings);
        try {
            ApplyMaxConnections(ns, key, settings.maxConnections);
            if (ReadText(ns, kAlgorithm) != KernelAlgorithm(settings.congestionControl))
                ApplyAlgorithm(ns, key, settings.congestionControl);
            // A kernel without IPv6 makes netstacks without it: "Current IPv6 Enabled" says so.
            if (HasIpv6(ns) && Ipv6On(ns) != settings.ipv6Enabled) ApplyIpv6(ns, key, settings.ipv6Enabled);
        } catch (...) {
            Kernel::DeleteNamedNamespace(key);
            throw;
        }
        if (!Kernel::MakeNamespaceFiles(key)) {
            context_.Warn("cannot make " + std::string(Kernel::kNamespaceFiles) + "/" + key +
                          ": the netstack has no files of its own for `ip netns exec`");
        }
    }

    // A dry run makes no namespace, so it cannot read what a new one starts with: each setting is
    // listed as the real run writes it where it differs from that, and refused as the kernel
    // would refuse it (an algorithm it bars in other namespaces, IPv6 it does not have).
    void CreateDryRun(const std::string& key, const Kernel::Namespace& ns,
                      const Backend::NetstackSettings& settings) {
        try {
            Kernel::WriteSysctl(ns, kSomaxconn, std::to_string(settings.maxConnections));
            ApplyAlgorithm(ns, key, settings.congestionControl);
            if (HasIpv6(Kernel::Namespace::Own())) {
                Kernel::WriteSysctl(ns, kIpv6All, settings.ipv6Enabled ? "0" : "1");
                Kernel::WriteSysctl(ns, kIpv6Default, settings.ipv6Enabled ? "0" : "1");
            } else if (settings.ipv6Enabled) {
                throw HostCtlException("IPv6 cannot be enabled in netstack instance " + Lib::Quote(key) +
                                       ": the kernel has no IPv6 (net.ipv6 settings are missing)");
            }
        } catch (const HostCtlException&) {
            Kernel::DeleteNamedNamespace(key);  // as the real run takes it away again
            throw;
        }
        Kernel::MakeNamespaceFiles(key);
    }

    void ApplyMaxConnections(const Kernel::Namespace& ns, const std::string& key, std::uint32_t value) {
        Kernel::WriteSysctl(ns, kSomaxconn, std::to_string(value));
        if (Kernel::DryRun()) return;  // nothing written to read back, here and below
        std::uint32_t now = ReadNumber(ns, kSomaxconn);
        Check(now == value, "Netstack instance " + Lib::Quote(key) + " has " + std::to_string(now) +
                                " as its maximum number of connections after " + std::to_string(value) +
                                " was set");
    }

    void ApplyAlgorithm(const Kernel::Namespace& ns, const std::string& key, const std::string& algorithm) {
        std::string kernelName = KernelAlgorithm(algorithm);
        if (Kernel::DryRun()) {
            // The kernel would refuse an algorithm it does not offer, or one it bars in a
            // namespace other than its first: refused here as it would be.
            // (A namespace the dry run would make has the lists of the program's own.)
            const auto from = Kernel::IsPlannedNamespace(ns) ? Kernel::Namespace::Own() : ns;
            const std::string available = Kernel::ReadSysctl(from, kAvailable).value_or("");
            const std::string allowed =
                ns.IsOwn() ? available : Kernel::ReadSysctl(from, kAllowed).value_or("");
            if (std::string why = AlgorithmRefusal(key, algorithm, allowed, available); !why.empty())
                throw HostCtlException(why);
            return Kernel::WriteSysctl(ns, kAlgorithm, kernelName);
        }
        try {
            Kernel::WriteSysctl(ns, kAlgorithm, kernelName);
        } catch (const HostCtlException& refused) {
            std::string why = AlgorithmRefusal(key, algorithm, Kernel::ReadSysctl(ns, kAllowed).value_or(""),
                                               Kernel::ReadSysctl(ns, kAvailable).value_or(""));
            throw HostCtlException(why.empty() ? refused.what() : why);
        }
        std::string now = ReadText(ns, kAlgorithm);
        Check(now == kernelName, "Netstack instance " + Lib::Quote(key) +
                                     " uses congestion-control algorithm " + Lib::Quote(HostAlgorithm(now)) +
                                     " after " + Lib::Quote(algorithm) + " was set");
    }

    void ApplyIpv6(const Kernel::Namespace& ns, const std::string& key, bool enabled) {
        if (!HasIpv6(ns)) {
            if (!enabled) return;
            throw HostCtlException("IPv6 cannot be enabled in netstack instance " + Lib::Quote(key) +
                                   ": the kernel has no IPv6 (net.ipv6 settings are missing)");
        }
        // "all" changes every interface there, "default" those to come.
        Kernel::WriteSysctl(ns, kIpv6All, enabled ? "0" : "1");
        Kernel::WriteSysctl(ns, kIpv6Default, enabled ? "0" : "1");
        if (Kernel::DryRun()) return;
        Check(Ipv6On(ns) == enabled, std::string("IPv6 is still ") + (enabled ? "disabled" : "enabled") +
                                         " in netstack instance " + Lib::Quote(key) + " after it was " +
                                         (enabled ? "enabled" : "disabled"));
    }

    // A namespace goes with its interfaces: refused while it has any.
    void RefuseWhileInUse(const std::string& key, const char* what) {
        std::string names;
        for (const auto& link : Kernel::ListLinks(context_.NamespaceOf(key))) {
            if (IsNamespaceDevice(link)) continue;
            names += (names.empty() ? "" : ", ") + link.name;
        }
        if (!names.empty()) {
            throw HostCtlException("Netstack instance " + Lib::Quote(key) + " cannot be " + what +
                                   " while interfaces use it: " + names);
        }
    }

    static Kernel::SocketKind KernelKind(Backend::ConnectionClass kind) {
        switch (kind) {
            case Backend::ConnectionClass::kTcp:
                return Kernel::SocketKind::kTcp;
            case Backend::ConnectionClass::kUdp:
                return Kernel::SocketKind::kUdp;
            case Backend::ConnectionClass::kIp:
                break;
        }
        return Kernel::SocketKind::kRaw;
    }

    Context& context_;
    // The owners of the sockets last listed, by PID.
    std::map<std::uint32_t, std::string> seen_;
};

}  // namespace

std::unique_ptr<Backend::Netstacks> MakeNetstacks(Context& context) {
    return std::make_unique<LinuxNetstacks>(context);
}

}  // namespace TknCtl::Linux

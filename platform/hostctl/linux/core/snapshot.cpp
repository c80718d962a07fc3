#include "core/snapshot.h"

#include <fcntl.h>
#include <linux/if_addr.h>
#include <linux/neighbour.h>
#include <linux/rtnetlink.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <map>
#include <nlohmann/json.hpp>
#include <stdexcept>

#include "core/context.h"
#include "hostctl/exception.h"
#include "kernel/addresses.h"
#include "kernel/links.h"
#include "kernel/namespaces.h"
#include "kernel/neighbours.h"
#include "kernel/nftables.h"
#include "kernel/resolv.h"
#include "kernel/routes.h"
#include "kernel/sysctl.h"

namespace TknCtl::Linux {

using HostCtl::Lib::HostCtlException;
using nlohmann::json;

const char* const kSavedSysctls[4] = {"core/somaxconn", "ipv4/tcp_congestion_control",
                                      "ipv6/conf/all/disable_ipv6", "ipv6/conf/default/disable_ipv6"};

namespace {

constexpr int kVersion = 1;
// The address protocols of the kernel's own addresses (IFAPROT_KERNEL_LO, _RA, _LL).
constexpr unsigned kKernelLoopback = 1, kKernelRouterAdvertisement = 2, kKernelLinkLocal = 3;
constexpr unsigned kLocalTable = 255;
constexpr unsigned kRedirectProtocol = 1, kRouterAdvertisementProtocol = 9;

// ---------------------------------------------------------------- reading JSON strictly

// Members of one object, each read once; an unknown member or one of the wrong type is refused.
class Reader {
public:
    Reader(const json& object, std::string where) : object_(object), where_(std::move(where)) {
        if (!object_.is_object()) Fail("is not an object");
    }

    [[noreturn]] void Fail(const std::string& what) const {
        throw std::invalid_argument((where_.empty() ? std::string("the snapshot") : where_) + " " + what);
    }

    const json* Find(const char* name) {
        seen_.push_back(name);
        auto it = object_.find(name);
        return it == object_.end() ? nullptr : &*it;
    }
    const json& Need(const char* name) {
        const json* value = Find(name);
        if (!value) Fail(std::string("has no member \"") + name + "\"");
        return *value;
    }
    std::string Where(const std::string& member) const {
        return where_.empty() ? member : where_ + "." + member;
    }

    std::string String(const char* name) {
        const json& value = Need(name);
        if (!value.is_string()) Wrong(name, "a string");
        return value.get<std::string>();
    }
    std::optional<std::string> MaybeString(const char* name) {
        const json* value = Find(name);
        if (!value || value->is_null()) return std::nullopt;
        if (!value->is_string()) Wrong(name, "a string or null");
        return value->get<std::string>();
    }
    bool Bool(const char* name) {
        const json& value = Need(name);
        if (!value.is_boolean()) Wrong(name, "true or false");
        return value.get<bool>();
    }
    std::optional<bool> MaybeBool(const char* name) {
        const json* value = Find(name);
        if (!value || value->is_null()) return std::nullopt;
        if (!value->is_boolean()) Wrong(name, "true, false or null");
        return value->get<bool>();
    }
    std::uint64_t Unsigned(const char* name, std::uint64_t max = UINT32_MAX) {
        const json& value = Need(name);
        if (!value.is_number_unsigned() || value.get<std::uint64_t>() > max)
            Wrong(name, "a number from 0 to " + std::to_string(max));
        return value.get<std::uint64_t>();
    }
    std::int64_t Integer(const char* name) {
        const json& value = Need(name);
        if (!value.is_number_integer()) Wrong(name, "an integer");
        return value.get<std::int64_t>();
    }
    const json& Array(const char* name) {
        const json& value = Need(name);
        if (!value.is_array()) Wrong(name, "an array");
        return value;
    }

    // Every member was asked for.
    void Done() const {
        for (const auto& [name, value] : object_.items()) {
            if (std::find(seen_.begin(), seen_.end(), name) == seen_.end())
                Fail("has an unknown member \"" + name + "\"");
        }
    }

private:
    [[noreturn]] void Wrong(const char* name, const std::string& what) const {
        throw std::invalid_argument(Where(name) + " is not " + what);
    }

    const json& object_;
    std::string where_;
    std::vector<std::string> seen_;
};

int Family(Reader& reader, const char* name = "family") {
    auto value = reader.Unsigned(name);
    if (value != AF_INET && value != AF_INET6)
        reader.Fail(std::string("has a \"") + name + "\" of no address family");
    return static_cast<int>(value);
}

template <class T, class Read>
std::vector<T> List(Reader& reader, const char* name, Read read) {
    std::vector<T> out;
    const json& array = reader.Array(name);
    for (std::size_t i = 0; i < array.size(); ++i) {
        Reader item(array[i], reader.Where(name) + "[" + std::to_string(i) + "]");
        out.push_back(read(item));
        item.Done();
    }
    return out;
}

// ---------------------------------------------------------------- to JSON

json ToJson(const SavedLink& link) {
    json out{{"index", link.index}, {"name", link.name}, {"kind", link.kind},
             {"mac", link.mac},     {"mtu", link.mtu},   {"up", link.up}};
    out["master"] = link.master;
    out["peerNetstack"] = link.peerNetstack;
    out["peerName"] = link.peerName;
    out["rxQueues"] = link.rxQueues;
    out["gsoMaxSize"] = link.gsoMaxSize;
    out["vlanFiltering"] = link.vlanFiltering ? json(*link.vlanFiltering) : json();
    if (link.port) {
        out["port"] = json{{"learning", link.port->learning},
                           {"unicastFlood", link.port->unicastFlood},
                           {"neighSuppress", link.port->neighSuppress},
                           {"locked", link.port->locked ? json(*link.port->locked) : json()}};
    } else {
        out["port"] = nullptr;
    }
    json vlans = json::array();
    for (const auto& vlan : link.vlans)
        vlans.push_back(
            {{"vid", vlan.vid}, {"lastVid", vlan.lastVid}, {"pvid", vlan.pvid}, {"untagged", vlan.untagged}});
    out["vlans"] = std::move(vlans);
    out["staticEntries"] = link.staticEntries;
    if (link.bucket) {
        out["bucket"] = json{{"rate", link.bucket->rate},
                             {"burst", link.bucket->burst},
                             {"peakRate", link.bucket->peakRate},
                             {"peakBucket", link.bucket->peakBucket},
                             {"limit", link.bucket->limit}};
    } else {
        out["bucket"] = nullptr;
    }
    out["acceptRa"] = link.acceptRa ? json(*link.acceptRa) : json();
    out["disableIpv6"] = link.disableIpv6 ? json(*link.disableIpv6) : json();
    return out;
}

json ToJson(const SavedAddress& a) {
    return json{{"family", a.family},
                {"device", a.device},
                {"address", a.address},
                {"prefixLength", a.prefixLength},
                {"peer", a.peer},
                {"broadcast", a.broadcast},
                {"label", a.label},
                {"flags", a.flags},
                {"scope", a.scope},
                {"permanent", a.permanent},
                {"validLifetime", a.validLifetime},
                {"preferredLifetime", a.preferredLifetime}};
}

json ToJson(const SavedRoute& r) {
    json hops = json::array();
    for (const auto& hop : r.nexthops)
        hops.push_back({{"gateway", hop.gateway}, {"device", hop.device}});
    return json{{"family", r.family},
                {"table", r.table},
                {"destination", r.destination},
                {"prefixLength", r.prefixLength},
                {"protocol", r.protocol},
                {"type", r.type},
                {"scope", r.scope},
                {"metric", r.metric},
                {"preferredSource", r.preferredSource},
                {"nexthops", std::move(hops)}};
}

json ToJson(const SavedNeighbour& n) {
    return json{{"family", n.family},
                {"device", n.device},
                {"address", n.address},
                {"linkLayer", n.linkLayer},
                {"flags", n.flags}};
}

json ToJson(const Kernel::XfrmSelector& s) {
    return json{{"family", s.family},
                {"source", s.source},
                {"sourcePrefix", s.sourcePrefix},
                {"destination", s.destination},
                {"destinationPrefix", s.destinationPrefix},
                {"sourcePort", s.sourcePort},
                {"destinationPort", s.destinationPort},
                {"protocol", s.protocol}};
}

json ToJson(const SavedPolicy& p) {
    json templates = json::array();
    for (const auto& t : p.templates) {
        templates.push_back({{"family", t.family},
                             {"source", t.source},
                             {"destination", t.destination},
                             {"spi", t.spi},
                             {"protocol", t.protocol},
                             {"mode", t.mode}});
    }
    return json{
        {"selector", ToJson(p.selector)}, {"direction", p.direction}, {"action", p.action},
        {"priority", p.priority},         {"mainType", p.mainType},   {"templates", std::move(templates)}};
}

json ToJson(const SavedNetstack& n) {
    json out{{"name", n.name}};
    json links = json::array(), addresses = json::array(), routes = json::array(), neighbours = json::array();
    for (const auto& link : n.links)
        links.push_back(ToJson(link));
    for (const auto& address : n.addresses)
        addresses.push_back(ToJson(address));
    for (const auto& route : n.routes)
        routes.push_back(ToJson(route));
    for (const auto& neighbour : n.neighbours)
        neighbours.push_back(ToJson(neighbour));
    out["links"] = std::move(links);
    out["addresses"] = std::move(addresses);
    out["routes"] = std::move(routes);
    out["neighbours"] = std::move(neighbours);
    out["sysctls"] = n.sysctls;
    out["hasFiles"] = n.hasFiles;
    out["resolvConf"] = n.resolvConf ? json(*n.resolvConf) : json();
    out["resolvManaged"] = n.resolvManaged;
    return out;
}

// ---------------------------------------------------------------- from JSON

SavedLink LinkFrom(Reader& r) {
    SavedLink link;
    link.index = static_cast<int>(r.Unsigned("index", INT32_MAX));
    link.name = r.String("name");
    if (link.name.empty()) r.Fail("has a link without a name");
    link.kind = r.String("kind");
    link.mac = r.String("mac");
    link.mtu = static_cast<unsigned>(r.Unsigned("mtu"));
    link.up = r.Bool("up");
    link.master = r.String("master");
    link.peerNetstack = r.String("peerNetstack");
    link.peerName = r.String("peerName");
    link.rxQueues = static_cast<unsigned>(r.Unsigned("rxQueues"));
    link.gsoMaxSize = static_cast<unsigned>(r.Unsigned("gsoMaxSize"));
    link.vlanFiltering = r.MaybeBool("vlanFiltering");
    if (const json* port = r.Find("port"); port && !port->is_null()) {
        Reader p(*port, r.Where("port"));
        SavedPortFlags flags;
        flags.learning = p.Bool("learning");
        flags.unicastFlood = p.Bool("unicastFlood");
        flags.neighSuppress = p.Bool("neighSuppress");
        flags.locked = p.MaybeBool("locked");
        p.Done();
        link.port = flags;
    }
    link.vlans = List<Kernel::PortVlan>(r, "vlans", [](Reader& v) {
        Kernel::PortVlan vlan;
        vlan.vid = static_cast<std::uint16_t>(v.Unsigned("vid", 4095));
        vlan.lastVid = static_cast<std::uint16_t>(v.Unsigned("lastVid", 4095));
        vlan.pvid = v.Bool("pvid");
        vlan.untagged = v.Bool("untagged");
        return vlan;
    });
    const json& entries = r.Array("staticEntries");
    for (const auto& entry : entries) {
        if (!entry.is_string()) r.Fail("has a static entry that is not a string");
        link.staticEntries.push_back(entry.get<std::string>());
    }
    if (const json* bucket = r.Find("bucket"); bucket && !bucket->is_null()) {
        Reader b(*bucket, r.Where("bucket"));
        Kernel::TokenBucket tbf;
        tbf.rate = static_cast<std::uint32_t>(b.Unsigned("rate"));
        tbf.burst = static_cast<std::uint32_t>(b.Unsigned("burst"));
        tbf.peakRate = static_cast<std::uint32_t>(b.Unsigned("peakRate"));
        tbf.peakBucket = static_cast<std::uint32_t>(b.Unsigned("peakBucket"));
        tbf.limit = static_cast<std::uint32_t>(b.Unsigned("limit"));
        b.Done();
        link.bucket = tbf;
    }
    link.acceptRa = r.MaybeString("acceptRa");
    link.disableIpv6 = r.MaybeString("disableIpv6");
    return link;
}

SavedAddress AddressFrom(Reader& r) {
    SavedAddress a;
    a.family = Family(r);
    a.device = r.String("device");
    a.address = r.String("address");
    a.prefixLength = static_cast<unsigned>(r.Unsigned("prefixLength", 128));
    a.peer = r.String("peer");
    a.broadcast = r.String("broadcast");
    a.label = r.String("label");
    a.flags = static_cast<std::uint32_t>(r.Unsigned("flags"));
    a.scope = static_cast<unsigned>(r.Unsigned("scope", 255));
    a.permanent = r.Bool("permanent");
    a.validLifetime = static_cast<std::uint32_t>(r.Unsigned("validLifetime"));
    a.preferredLifetime = static_cast<std::uint32_t>(r.Unsigned("preferredLifetime"));
    return a;
}

SavedRoute RouteFrom(Reader& r) {
    SavedRoute route;
    route.family = Family(r);
    route.table = static_cast<unsigned>(r.Unsigned("table"));
    route.destination = r.String("destination");
    route.prefixLength = static_cast<unsigned>(r.Unsigned("prefixLength", 128));
    route.protocol = static_cast<unsigned>(r.Unsigned("protocol", 255));
    route.type = static_cast<unsigned>(r.Unsigned("type", 255));
    route.scope = static_cast<unsigned>(r.Unsigned("scope", 255));
    route.metric = static_cast<std::uint32_t>(r.Unsigned("metric"));
    route.preferredSource = r.String("preferredSource");
    route.nexthops = List<SavedNexthop>(r, "nexthops", [](Reader& h) {
        SavedNexthop hop;
        hop.gateway = h.String("gateway");
        hop.device = h.String("device");
        return hop;
    });
    return route;
}

SavedNeighbour NeighbourFrom(Reader& r) {
    SavedNeighbour n;
    n.family = Family(r);
    n.device = r.String("device");
    n.address = r.String("address");
    n.linkLayer = r.String("linkLayer");
    n.flags = static_cast<std::uint8_t>(r.Unsigned("flags", 255));
    return n;
}

Kernel::XfrmSelector SelectorFrom(Reader& r) {
    Kernel::XfrmSelector s;
    s.family = Family(r);
    s.source = r.String("source");
    s.sourcePrefix = static_cast<unsigned>(r.Unsigned("sourcePrefix", 128));
    s.destination = r.String("destination");
    s.destinationPrefix = static_cast<unsigned>(r.Unsigned("destinationPrefix", 128));
    s.sourcePort = static_cast<std::uint16_t>(r.Unsigned("sourcePort", 65535));
    s.destinationPort = static_cast<std::uint16_t>(r.Unsigned("destinationPort", 65535));
    s.protocol = static_cast<int>(r.Unsigned("protocol", 255));
    return s;
}

SavedPolicy PolicyFrom(Reader& r) {
    SavedPolicy p;
    Reader selector(r.Need("selector"), r.Where("selector"));
    p.selector = SelectorFrom(selector);
    selector.Done();
    p.direction = static_cast<int>(r.Unsigned("direction", 2));
    p.action = static_cast<int>(r.Unsigned("action", 1));
    p.priority = static_cast<std::uint32_t>(r.Unsigned("priority"));
    p.mainType = r.Bool("mainType");
    p.templates = List<Kernel::XfrmTemplate>(r, "templates", [](Reader& t) {
        Kernel::XfrmTemplate tmpl;
        tmpl.family = Family(t);
        tmpl.source = t.String("source");
        tmpl.destination = t.String("destination");
        tmpl.spi = static_cast<std::uint32_t>(t.Unsigned("spi"));
        tmpl.protocol = static_cast<int>(t.Unsigned("protocol", 255));
        tmpl.mode = static_cast<int>(t.Unsigned("mode", 255));
        return tmpl;
    });
    return p;
}

SavedNetstack NetstackFrom(Reader& r) {
    SavedNetstack n;
    n.name = r.String("name");
    if (n.name != Context::kDefaultNetstack && !Kernel::IsNamespaceName(n.name))
        r.Fail("has a netstack named " + json(n.name).dump() + ", which no namespace can be");
    n.links = List<SavedLink>(r, "links", LinkFrom);
    n.addresses = List<SavedAddress>(r, "addresses", AddressFrom);
    n.routes = List<SavedRoute>(r, "routes", RouteFrom);
    n.neighbours = List<SavedNeighbour>(r, "neighbours", NeighbourFrom);
    const json& sysctls = r.Need("sysctls");
    if (!sysctls.is_object()) r.Fail("has sysctls that are not an object");
    for (const auto& [name, value] : sysctls.items()) {
        if (!value.is_string()) r.Fail("has a sysctl " + name + " that is not a string");
        if (std::find(std::begin(kSavedSysctls), std::end(kSavedSysctls), name) == std::end(kSavedSysctls))
            r.Fail("has a sysctl " + name + " that a snapshot does not keep");
        n.sysctls[name] = value.get<std::string>();
    }
    n.hasFiles = r.Bool("hasFiles");
    n.resolvConf = r.MaybeString("resolvConf");
    n.resolvManaged = r.Bool("resolvManaged");
    return n;
}

// ---------------------------------------------------------------- reading the host

std::string Lower(std::string text) {
    for (auto& c : text)
        c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    return text;
}

bool Exists(const std::string& path) {
    struct stat info {};
    return lstat(path.c_str(), &info) == 0;
}

// The whole file; nothing when there is none. Throws HostCtlException when it cannot be read.
std::optional<std::string> ReadWhole(const std::string& path) {
    int fd = open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    if (fd < 0) {
        if (errno == ENOENT) return std::nullopt;
        throw HostCtlException("Cannot take a checkpoint: cannot read " + path + ": " + std::strerror(errno));
    }
    std::string text;
    char buffer[65536];
    while (true) {
        ssize_t n = read(fd, buffer, sizeof(buffer));
        if (n < 0 && errno == EINTR) continue;
        if (n < 0) {
            int error = errno;
            close(fd);
            throw HostCtlException("Cannot take a checkpoint: cannot read " + path + ": " +
                                   std::strerror(error));
        }
        if (n == 0) break;
        text.append(buffer, static_cast<std::size_t>(n));
    }
    close(fd);
    return text;
}

// What one netstack holds, with each veth's peer still as the kernel names it (an index, in
// a namespace known by its ID); PeerOf resolves them once every netstack is read.
struct RawPeer {
    int index = 0;
    std::optional<int> namespaceId;
};

struct ReadNetstack {
    SavedNetstack saved;
    Kernel::Namespace ns = Kernel::Namespace::Own();
    std::map<int, std::string> names;  // index -> name
    std::map<std::string, RawPeer> peers;
};

ReadNetstack ReadOne(const std::string& name, const Kernel::Namespace& ns) {
    ReadNetstack out;
    out.ns = ns;
    out.saved.name = name;
    auto links = Kernel::ListBridgeLinks(ns);
    auto details = Kernel::ListLinks(ns, false);
    std::map<int, const Kernel::Link*> detailOf;
    for (const auto& link : details)
        detailOf[link.index] = &link;
    bool vlanFiltering = false, ports = false;
    for (const auto& link : links) {
        out.names[link.index] = link.name;
        if (link.bridge && link.bridge->vlanFilteringAvailable) vlanFiltering = true;
        if (link.port) ports = true;
    }

    std::map<int, std::vector<Kernel::PortVlan>> vlans;
    if (vlanFiltering) {
        for (auto& [index, list] : Kernel::ListPortVlans(ns))
            vlans[index] = std::move(list);
    }
    std::map<int, std::vector<std::string>> entries;
    if (ports) {
        for (const auto& entry : Kernel::ListForwardingEntries(ns)) {
            if (entry.isStatic && !entry.local) entries[entry.port].push_back(Lower(entry.mac));
        }
    }
    std::map<int, Kernel::TokenBucket> buckets;
    for (const auto& root : Kernel::ListRootQdiscs(ns)) {
        if (root.kind == "tbf" && root.bucket) buckets[root.link] = *root.bucket;
    }

    for (const auto& link : links) {
        SavedLink saved;
        saved.index = link.index;
        saved.name = link.name;
        saved.kind = link.kind;
        saved.mac = Lower(link.mac);
        saved.mtu = link.mtu;
        saved.up = link.up;
        if (link.master) {
            auto it = out.names.find(link.master);
            if (it != out.names.end()) saved.master = it->second;
        }
        if (link.kind == "veth") {
            out.peers[link.name] = RawPeer{link.peer, link.peerNamespaceId};
            if (auto it = detailOf.find(link.index); it != detailOf.end()) {
                saved.rxQueues = it->second->numRxQueues;
                saved.gsoMaxSize = it->second->gsoMaxSize;
            }
        }
        if (link.bridge && link.bridge->vlanFilteringAvailable)
            saved.vlanFiltering = link.bridge->vlanFiltering;
        if (link.port) {
            SavedPortFlags flags;
            flags.learning = link.port->learning;
            flags.unicastFlood = link.port->unicastFlood;
            flags.neighSuppress = link.port->neighSuppress;
            if (link.port->hasLocked) flags.locked = link.port->locked;
            saved.port = flags;
        }
        if (auto it = vlans.find(link.index); it != vlans.end()) saved.vlans = it->second;
        if (auto it = entries.find(link.index); it != entries.end()) {
            saved.staticEntries = it->second;
            std::sort(saved.staticEntries.begin(), saved.staticEntries.end());
            saved.staticEntries.erase(std::unique(saved.staticEntries.begin(), saved.staticEntries.end()),
                                      saved.staticEntries.end());
        }
        if (auto it = buckets.find(link.index); it != buckets.end()) saved.bucket = it->second;
        // A name the kernel's settings tree cannot hold ("." or "..") has no settings to keep.
        if (link.name != "." && link.name != ".." && link.name.find('/') == std::string::npos) {
            saved.acceptRa = Kernel::ReadSysctl(ns, "ipv6/conf/" + link.name + "/accept_ra");
            saved.disableIpv6 = Kernel::ReadSysctl(ns, "ipv6/conf/" + link.name + "/disable_ipv6");
        }
        out.saved.links.push_back(std::move(saved));
    }

    auto device = [&](int index) {
        auto it = out.names.find(index);
        return it == out.names.end() ? std::string() : it->second;
    };
    for (const auto& address : Kernel::ListAddresses(ns, AF_UNSPEC)) {
        if (address.protocol == kKernelLoopback || address.protocol == kKernelRouterAdvertisement ||
            address.protocol == kKernelLinkLocal)
            continue;
        if (address.family == AF_INET6 && !(address.flags & IFA_F_PERMANENT)) continue;  // autoconfigured
        SavedAddress saved;
        saved.family = address.family;
        saved.device = device(address.index);
        if (saved.device.empty()) continue;
        saved.address = address.address;
        saved.prefixLength = address.prefixLength;
        saved.peer = address.peer;
        saved.broadcast = address.broadcast;
        saved.label = address.label;
        saved.flags = address.flags & kSavedAddressFlags;
        saved.scope = address.scope;
        saved.permanent =
            address.validLifetime == Kernel::kForever && address.preferredLifetime == Kernel::kForever;
        if (!saved.permanent) {
            saved.validLifetime = address.validLifetime;
            saved.preferredLifetime = address.preferredLifetime;
        }
        out.saved.addresses.push_back(std::move(saved));
    }

    for (int family : {AF_INET, AF_INET6}) {
        for (const auto& route : Kernel::ListRoutes(ns, family)) {
            if (route.table == kLocalTable || route.protocol == kRedirectProtocol ||
                route.protocol == kRouterAdvertisementProtocol)
                continue;
            SavedRoute saved;
            saved.family = route.family;
            saved.table = route.table;
            saved.destination = route.destination;
            saved.prefixLength = route.prefixLength;
            saved.protocol = route.protocol;
            saved.type = route.type;
            saved.scope = route.scope;
            saved.metric = route.metric;
            saved.preferredSource = route.preferredSource;
            for (const auto& hop : route.nexthops)
                saved.nexthops.push_back({hop.gateway, device(hop.index)});
            out.saved.routes.push_back(std::move(saved));
        }
        for (const auto& neighbour : Kernel::ListNeighbours(ns, family)) {
            if (!(neighbour.state & NUD_PERMANENT)) continue;
            SavedNeighbour saved;
            saved.family = neighbour.family;
            saved.device = device(neighbour.index);
            if (saved.device.empty()) continue;
            saved.address = neighbour.address;
            saved.linkLayer = Lower(neighbour.linkLayer);
            saved.flags = neighbour.flags & NTF_ROUTER;
            out.saved.neighbours.push_back(std::move(saved));
        }
    }

    for (const char* setting : kSavedSysctls) {
        if (auto value = Kernel::ReadSysctl(ns, setting)) out.saved.sysctls[setting] = *value;
    }
    const std::string key = ns.IsOwn() ? std::string() : name;
    if (!ns.IsOwn()) out.saved.hasFiles = Exists(std::string(Kernel::kNamespaceFiles) + "/" + name);
    const std::string path = Kernel::ResolvConfPath(key);
    out.saved.resolvManaged = !Kernel::ResolvConfManager(path).empty();
    if (!out.saved.resolvManaged && Exists(path)) out.saved.resolvConf = Kernel::ReadResolvConf(path);
    return out;
}

}  // namespace

bool SavedAddress::Same(const SavedAddress& other) const {
    return family == other.family && device == other.device && address == other.address &&
           prefixLength == other.prefixLength && peer == other.peer && broadcast == other.broadcast &&
           label == other.label && flags == other.flags && scope == other.scope &&
           permanent == other.permanent;
}

const SavedLink* SavedNetstack::FindLink(const std::string& linkName) const {
    for (const auto& link : links) {
        if (link.name == linkName) return &link;
    }
    return nullptr;
}

const SavedNetstack* Snapshot::FindNetstack(const std::string& netstack) const {
    for (const auto& n : netstacks) {
        if (n.name == netstack) return &n;
    }
    return nullptr;
}

std::string SnapshotToJson(const Snapshot& snapshot) {
    json out{{"version", kVersion}, {"taken", snapshot.taken}};
    json netstacks = json::array();
    for (const auto& n : snapshot.netstacks)
        netstacks.push_back(ToJson(n));
    out["netstacks"] = std::move(netstacks);
    out["netstackFiles"] = snapshot.netstackFiles;
    out["firewallKnown"] = snapshot.firewallKnown;
    out["firewall"] = snapshot.firewall ? json(*snapshot.firewall) : json();
    json policies = json::array(), states = json::array();
    for (const auto& policy : snapshot.policies)
        policies.push_back(ToJson(policy));
    for (const auto& state : snapshot.states) {
        states.push_back({{"family", state.family},
                          {"source", state.source},
                          {"destination", state.destination},
                          {"spi", state.spi},
                          {"protocol", state.protocol}});
    }
    out["policies"] = std::move(policies);
    out["states"] = std::move(states);
    out["document"] = snapshot.document ? json(*snapshot.document) : json();
    return out.dump(1) + "\n";
}

Snapshot SnapshotFromJson(std::string_view text) {
    json parsed = json::parse(text, nullptr, false);
    if (parsed.is_discarded()) throw std::invalid_argument("the snapshot is not valid JSON");
    Reader r(parsed, {});
    if (r.Integer("version") != kVersion)
        throw std::invalid_argument("the snapshot is not of version " + std::to_string(kVersion));
    Snapshot s;
    s.taken = r.Integer("taken");
    s.netstacks = List<SavedNetstack>(r, "netstacks", NetstackFrom);
    if (s.netstacks.empty() || s.netstacks.front().name != Context::kDefaultNetstack)
        throw std::invalid_argument("the snapshot does not start with the default netstack");
    s.netstackFiles = r.Bool("netstackFiles");
    s.firewallKnown = r.Bool("firewallKnown");
    s.firewall = r.MaybeString("firewall");
    s.policies = List<SavedPolicy>(r, "policies", PolicyFrom);
    s.states = List<SavedState>(r, "states", [](Reader& st) {
        SavedState state;
        state.family = Family(st);
        state.source = st.String("source");
        state.destination = st.String("destination");
        state.spi = static_cast<std::uint32_t>(st.Unsigned("spi"));
        state.protocol = static_cast<int>(st.Unsigned("protocol", 255));
        return state;
    });
    s.document = r.MaybeString("document");
    r.Done();
    return s;
}

std::string FirewallObjects(const std::string& listing) {
    json parsed = json::parse(listing, nullptr, false);
    if (parsed.is_discarded() || !parsed.is_object() || !parsed.contains("nftables") ||
        !parsed["nftables"].is_array())
        throw HostCtlException("Cannot take a checkpoint: the firewall's nftables listing is not JSON");
    json objects = json::array();
    for (auto& object : parsed["nftables"]) {
        if (!object.is_object() || object.contains("metainfo")) continue;
        for (auto& [kind, body] : object.items()) {
            if (body.is_object()) body.erase("handle");
        }
        objects.push_back(object);
    }
    return objects.dump();
}

Snapshot TakeSnapshot(Context& context) {
    Snapshot snapshot;
    snapshot.taken = static_cast<std::int64_t>(std::time(nullptr));
    std::vector<ReadNetstack> read;
    for (const auto& name : context.Netstacks())
        read.push_back(ReadOne(name, context.NamespaceOf(name)));

    // Each veth's other end, by netstack and name: in its own netstack when the kernel names no
    // other namespace, else in the netstack whose namespace has that ID from this one (asked
    // once for each two netstacks).
    std::map<std::pair<std::size_t, std::size_t>, std::optional<int>> ids;
    auto idOf = [&](std::size_t from, std::size_t of) {
        auto [it, fresh] = ids.try_emplace({from, of});
        if (fresh) it->second = Kernel::NamespaceId(read[from].ns, read[of].ns);
        return it->second;
    };
    for (std::size_t i = 0; i < read.size(); ++i) {
        auto& one = read[i];
        for (auto& link : one.saved.links) {
            auto it = one.peers.find(link.name);
            if (it == one.peers.end()) continue;
            const RawPeer& peer = it->second;
            const ReadNetstack* where = nullptr;
            if (!peer.namespaceId) {
                where = &one;
            } else {
                for (std::size_t j = 0; j < read.size(); ++j) {
                    if (j != i && idOf(i, j) == peer.namespaceId) {
                        where = &read[j];
                        break;
                    }
                }
            }
            if (!where) continue;
            auto name = where->names.find(peer.index);
            if (name == where->names.end()) continue;
            link.peerNetstack = where->saved.name;
            link.peerName = name->second;
        }
    }
    for (auto& one : read)
        snapshot.netstacks.push_back(std::move(one.saved));
    snapshot.netstackFiles = Exists(Kernel::kNamespaceFiles);

    const auto own = Kernel::Namespace::Own();
    Kernel::Nftables* nft = nullptr;
    try {
        nft = &Kernel::Nftables::Get();
    } catch (const HostCtlException&) {
        // Without libnftables the firewall cannot be changed either: it is left out.
        snapshot.firewallKnown = false;
    }
    if (nft) {
        auto result =
            nft->Run(std::string("list table ") + Kernel::kFirewallFamily + " " + Kernel::kFirewallTable);
        if (result.ok) {
            snapshot.firewall = FirewallObjects(result.output);
        } else if (result.error.find("No such file or directory") == std::string::npos) {
            throw HostCtlException("Cannot take a checkpoint: cannot read the firewall's nftables table: " +
                                   result.error);
        }
    }
    for (const auto& policy : Kernel::ListPolicies(own)) {
        // Policies of sockets are their programs' business.
        if (policy.direction > Kernel::kXfrmForward) continue;
        snapshot.policies.push_back(SavedPolicy{policy.selector, policy.direction, policy.action,
                                                policy.priority, policy.mainType, policy.templates});
    }
    for (const auto& state : Kernel::ListStates(own))
        snapshot.states.push_back({state.family, state.source, state.destination, state.spi, state.protocol});
    snapshot.document = ReadWhole(context.GetDocument().Path());
    return snapshot;
}

}  // namespace TknCtl::Linux

// The IP interfaces of the Linux host: every device of each netstack (network namespace) that is
// neither the loopback nor a port of a bridge.
//
// What the library's interface records hold, and where it comes from here:
//   enabled           the device is administratively up
//   MTU, MAC          the device's
//   TSO MSS           the largest packet the stack hands the device to segment (gso_max_size):
//                     the kernel's counterpart of the largest segmentation offload
//   RX queues         the device's receive queues
//   connection point  the port group of an interface the host made on one (network/tknnic.h:
//                     a veth pair whose bridge end is a port of the port group); none for
//                     every other device ("N/A", -1)
//   port              none: a bridge port has no ID the host's port commands know
//   IPv4              the device's first address; leased (it expires: a DHCP client keeps it)
//                     shows as DHCP. A static setting makes it the device's only IPv4 address.
//   gateways          the default route of the netstack's main table through the device (of
//                     the lowest metric); a setting without a gateway takes that route away
//   IPv6 enabled      disable_ipv6 of the device is 0
//   router adverts    accept_ra of the device takes effect (1 unless it forwards, or 2)
//   DHCPv6            a leased IPv6 address is on the device; the kernel has no DHCP client of
//                     its own, so DHCP (both families) is shown where a client runs but neither
//                     started nor stopped here, nor is its use of DNS servers set
//   tags              kept in the host's document, by netstack and interface name
//   multicast groups  the device's IPv4 and IPv6 memberships (/proc/net/igmp, igmp6)
//
// Turning IPv6 off makes the kernel drop the device's addresses: the static ones are kept in
// the host's document and given back when IPv6 is turned on again.
//
// Interfaces are added on port groups as veth pairs (network/tknnic.h): the named end made in
// its netstack's namespace by the same request that makes the bridge end in the default one,
// the bridge end connected to the port group by the switches area (its VLAN, security and
// shaping), then the kernel read back; a step that fails takes the pair away again. Removing
// one disconnects and deletes the bridge end, which takes the named end with it; the kernel
// drops the routes and neighbour entries through it; its tags and kept addresses leave the
// host's document. Devices the host did not make so are not removed.
#include <linux/if_addr.h>
#include <linux/rtnetlink.h>
#include <sys/socket.h>

#include <algorithm>
#include <climits>
#include <memory>
#include <nlohmann/json.hpp>
#include <random>
#include <unordered_map>

#include "backend/interfaces.h"
#include "core/context.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "hostctl/network/vswitch.h"
#include "kernel/bridges.h"
#include "kernel/dryrun.h"
#include "kernel/request.h"
#include "kernel/sysctl.h"
#include "kernel/veth.h"
#include "model/tknnics.h"
#include "network/areas.h"
#include "network/kernel_view.h"
#include "network/tknnic.h"
#include "network/vswitch.h"

namespace TknCtl::Linux {

namespace {

using Backend::InterfaceId;
using HostCtl::Lib::HostCtlException;
using HostCtl::Network::IpConfig;
using HostCtl::Network::Ipv4Address;
using HostCtl::Network::Ipv4Network;
using HostCtl::Network::Ipv6Address;
using HostCtl::Network::Ipv6Network;
using HostCtl::Network::MacAddress;
using HostCtl::Network::TknNicTagType;
using nlohmann::json;

using HostCtl::Network::ConnectionPoint;

constexpr const char* kMember = "interfaces";
constexpr const char* kBridgeEndSuffix = "-port";

// Routes the interfaces area adds are an administrator's (RTPROT_STATIC); a DHCP client's or
// the kernel's from router advertisements are learned.
bool IsLearned(const Kernel::Route& route) {
    return route.protocol == RTPROT_DHCP || route.protocol == RTPROT_RA;
}

std::string Quote(const std::string& text) {
    return Lib::Quote(text);
}

std::string Describe(const InterfaceId& id) {
    return id.name + (id.netstack == Context::kDefaultNetstack ? std::string()
                                                               : " (netstack " + Quote(id.netstack) + ")");
}

MacAddress MacOf(const Kernel::Link& link) {
    return MacAddress::IsWellFormed(link.mac) ? MacAddress(link.mac) : MacAddress();
}

int Clamp(std::uint64_t value) {
    return value > static_cast<std::uint64_t>(INT_MAX) ? INT_MAX : static_cast<int>(value);
}

// The default route of a family through the device with a gateway, of the lowest metric.
const Kernel::Route* DefaultThrough(const std::vector<Kernel::Route>& routes, int index,
                                    bool learnedToo = true) {
    const Kernel::Route* best = nullptr;
    for (const auto& route : routes) {
        if (!route.IsDefault() || route.type != RTN_UNICAST || route.nexthops.size() != 1) continue;
        const auto& hop = route.nexthops.front();
        if (hop.index != index || hop.gateway.empty() || (!learnedToo && IsLearned(route))) continue;
        if (!best || route.metric < best->metric) best = &route;
    }
    return best;
}

std::string NetworkText(const Kernel::Address& address) {
    return address.address + "/" + std::to_string(address.prefixLength);
}

// The port group a connection point names; a kind of connection point the Linux host lacks
// is refused.
std::string PortGroupOf(const ConnectionPoint& point) {
    switch (point.GetConnectionType()) {
        case ConnectionPoint::TYPE_PORTGROUP:
            return point.GetPortGroupName();
        case ConnectionPoint::TYPE_DVPORT:
            throw HostCtlException("Distributed port " + Quote(point.GetDVPortParam().GetPortId()) +
                                   " cannot be a connection point: there is no distributed switch on a Linux "
                                   "host");
        case ConnectionPoint::TYPE_OPAQUE_NETWORK:
            throw HostCtlException("Opaque network " + Quote(point.GetOpaqueNetworkParam().GetNetworkId()) +
                                   " cannot be a connection point: opaque networks belong to distributed "
                                   "switches, and there is no distributed switch on a Linux host");
        default:
            break;
    }
    throw HostCtlException("Unknown connection point type " + std::to_string(point.GetConnectionType()));
}

class LinuxInterfaces final : public Backend::Interfaces {
public:
    explicit LinuxInterfaces(Context& context) : context_(context), views_(context), switches_(context) {}

    std::vector<InterfaceId> List(const std::string& netstack) override {
        std::vector<InterfaceId> out;
        if (!netstack.empty()) {
            AppendInterfaces(views_.Of(netstack), out);
            return out;
        }
        for (const auto& name : context_.Netstacks()) {
            try {
                AppendInterfaces(views_.Of(name), out);
            } catch (const HostCtlException& e) {
                if (name == Context::kDefaultNetstack) throw;
                context_.Warn("netstack " + Quote(name) + " is left out: " + e.GetMessage());
            }
        }
        return out;
    }

    std::optional<InterfaceId> Find(const std::string& name) override {
        std::vector<InterfaceId> found;
        for (const auto& netstack : context_.Netstacks()) {
            try {
                auto& view = views_.Of(netstack);
                if (view.IpInterface(name)) found.push_back({view.Netstack(), name});
            } catch (const HostCtlException&) {
                // A netstack the user cannot enter holds nothing this user can name.
                if (netstack == Context::kDefaultNetstack) throw;
            }
        }
        if (found.empty()) return std::nullopt;
        if (found.size() > 1) {
            std::string netstacks;
            for (const auto& id : found)
                netstacks += (netstacks.empty() ? "" : ", ") + Quote(id.netstack);
            context_.Warn("interface " + name + " is in netstacks " + netstacks + ": the one of " +
                          Quote(found.front().netstack) + " is meant");
        }
        return found.front();
    }

    Backend::InterfaceLink GetLink(const InterfaceId& id) override {
        const Kernel::Link& link = Require(id);
        Backend::InterfaceLink out;
        out.mac = MacOf(link);
        out.mtu = Clamp(link.mtu);
        out.tsoMss = Clamp(link.gsoMaxSize);
        out.rxQueues = Clamp(link.numRxQueues);
        out.enabled = link.up;
        return out;
    }

    void SetEnabled(const InterfaceId& id, bool enabled) override {
        if (Require(id).up == enabled) return;
        context_.BeginChange();
        Kernel::LinkChange change;
        change.up = enabled;
        Kernel::ChangeLink(View(id).Namespace(), id.name, change);
        // (A dry run changed nothing to read back, here and after every change below.)
        if (Kernel::DryRun()) return;
        if (Require(id).up != enabled) Differs(id, std::string("it is still ") + (enabled ? "down" : "up"));
    }

    void SetMtu(const InterfaceId& id, int mtu) override {
        if (Require(id).mtu == static_cast<unsigned>(mtu)) return;
        context_.BeginChange();
        Kernel::LinkChange change;
        change.mtu = static_cast<unsigned>(mtu);
        Kernel::ChangeLink(View(id).Namespace(), id.name, change);
        if (Kernel::DryRun()) return;
        unsigned now = Require(id).mtu;
        if (now != static_cast<unsigned>(mtu)) Differs(id, "its MTU is " + std::to_string(now));
    }

    IpConfig GetIpConfig(const InterfaceId& id) override {
        // A listing asks twice for each interface (its configuration, and the one in force).
        std::string key = id.netstack + '\n' + id.name;
        if (auto it = configs_.find(key); it != configs_.end() && it->second.first == Kernel::Generation())
            return it->second.second;
        IpConfig config = ReadIpConfig(id);
        configs_[key] = {Kernel::Generation(), config};
        return config;
    }

    IpConfig ReadIpConfig(const InterfaceId& id) {
        auto& view = View(id);
        const Kernel::Link& link = Require(id);
        int index = link.index;
        IpConfig config;

        const Kernel::Address* ipv4 = FirstIpv4(view, index);
        if (!ipv4) {
            config.SetIpv4UseNone();
        } else {
            config.SetIpv4Address(Ipv4Address(ipv4->address));
            config.SetIpv4Netmask(Ipv4Network::NetmaskFromNumber(ipv4->prefixLength));
            if (IsLeased(*ipv4)) config.SetUseDhcp(true);
            if (const auto* route = DefaultThrough(view.DefaultRoutes(AF_INET), index))
                config.SetIpv4Gateway(Ipv4Address(route->nexthops.front().gateway));
        }

        bool leasedIpv6 = false;
        std::vector<Ipv6Network> networks;
        for (const auto* address : view.AddressesOf(index)) {
            if (address->family != AF_INET6) continue;
            int origin = Ipv6Origin(*address);
            leasedIpv6 = leasedIpv6 || origin == Ipv6Network::ORIGIN_DHCP;
            networks.emplace_back(Ipv6Address(address->address), address->prefixLength, origin,
                                  Ipv6Status(*address));
        }
        config.SetIpv6Networks(std::move(networks));
        // The tables are read at one generation: `link` still stands.
        config.SetUseIpv6(link.ipv6 && !link.ipv6->disabled);
        config.SetUseIpv6RouterAdvertised(link.ipv6 && link.ipv6->AcceptsRouterAdvertisements());
        config.SetUseIpv6Dhcp(leasedIpv6);
        if (const auto* route = DefaultThrough(view.DefaultRoutes(AF_INET6), index))
            config.SetIpv6Gateway(Ipv6Address(route->nexthops.front().gateway));
        return config;
    }

    void SetIpConfig(const InterfaceId& id, const IpConfig& wanted) override {
        const IpConfig current = GetIpConfig(id);
        RefuseWhatLinuxCannot(id, current, wanted);
        if (!Differ(id, current, wanted)) return;
        context_.BeginChange();
        ApplyIpv4(id, wanted);
        ApplyIpv6(id, current, wanted);
        if (!Kernel::DryRun()) ReadBack(id, current, wanted);
    }

    std::string InterfaceWithAddress(const std::string& netstack,
                                     const HostCtl::Network::IpAddress& address) override {
        auto& view = views_.Of(netstack);
        std::string text = address.GetStringAddress();
        for (const auto& a : view.Addresses()) {
            if (a.family != address.GetFamily() || a.address != text) continue;
            const auto* link = view.LinkByIndex(a.index);
            if (link && IsIpInterface(*link, view.Links())) return link->name;
        }
        return {};
    }

    std::unique_ptr<HostCtl::Network::ConnectionPoint> GetConnectionPoint(const InterfaceId& id) override {
        auto end = BridgeEndOf(id);
        if (!end) return nullptr;
        const auto ports = switches_.ConnectedPorts();
        auto group = ports.find(end->name);
        if (group == ports.end()) return nullptr;  // taken out of its bridge
        return std::make_unique<TknCtl::Network::PortGroupImpl>(group->second);
    }

    std::unique_ptr<HostCtl::Network::Port> GetPort(const InterfaceId& id) override {
        Require(id);
        return nullptr;
    }

    std::vector<TknNicTagType> GetTags(const InterfaceId& id) override {
        Require(id);
        std::vector<TknNicTagType> tags;
        const json& names = TagsOf(context_.GetDocument().Read(kMember), id);
        for (const auto& name : names) {
            TknNicTagType tag = name.is_string() ? TknCtl::Network::TknNicTagNameToId(name.get<std::string>())
                                                 : HostCtl::Network::TKNNIC_TAG_INVALID;
            if (tag == HostCtl::Network::TKNNIC_TAG_INVALID)
                context_.GetDocument().Refuse(kMember,
                                              "interface " + id.name + " has an unknown tag " + name.dump());
            tags.push_back(tag);
        }
        return tags;
    }

    void SetTags(const InterfaceId& id, const std::vector<TknNicTagType>& tags) override {
        if (GetTags(id) == tags) return;
        context_.BeginChange();
        json& member = context_.GetDocument().Write(kMember);
        if (!member.is_object()) member = json::object();
        json& netstacks = member["tags"];
        if (!netstacks.is_object()) netstacks = json::object();
        json& names = netstacks[id.netstack];
        if (!names.is_object()) names = json::object();
        PruneGone(names, id);
        if (tags.empty()) {
            names.erase(id.name);
        } else {
            json list = json::array();
            for (auto tag : tags)
                list.push_back(TknCtl::Network::TknNicTagIdToName(tag));
            names[id.name] = std::move(list);
        }
        if (names.empty()) netstacks.erase(id.netstack);
        if (netstacks.empty()) member.erase("tags");
    }

    std::vector<HostCtl::Network::TknNic::MulticastGroup> GetMulticastGroups(const InterfaceId& id) override {
        auto& view = View(id);
        const Kernel::Link& link = Require(id);
        bool ethernet = link.mac.size() == 17;
        int index = link.index;
        std::vector<HostCtl::Network::TknNic::MulticastGroup> out;
        for (const auto& m : view.Memberships()) {
            if (m.index != index) continue;
            out.push_back({id.name, m.group, ethernet ? Kernel::EthernetGroupAddress(m.group) : std::string(),
                           m.users});
        }
        return out;
    }

    std::optional<InterfaceId> AttachedAt(const ConnectionPoint& point) override {
        const std::string group = PortGroupOf(point);
        for (const auto& [port, holder] : switches_.ConnectedPorts()) {
            if (holder != group) continue;
            if (auto id = InterfaceOfPort(port)) return id;
        }
        return std::nullopt;
    }

    void CheckAttachable(const ConnectionPoint& point) override { SwitchOf(PortGroupOf(point)); }

    bool MacInUse(const MacAddress& mac) override {
        if (mac.IsZero()) return false;
        for (const auto& netstack : context_.Netstacks()) {
            try {
                for (const auto& link : views_.Of(netstack).Links()) {
                    if (MacOf(link) == mac) return true;
                }
            } catch (const HostCtlException&) {
                // A netstack the program cannot enter: only a change would need it, and a
                // change is refused to whoever cannot enter it.
                if (netstack == Context::kDefaultNetstack) throw;
            }
        }
        return false;
    }

    InterfaceId Add(const ConnectionPoint& point, const std::string& netstack, const MacAddress& mac,
                    unsigned tsoMss, unsigned mtu, unsigned rxQueues, const std::string& name) override {
        const std::string group = PortGroupOf(point);
        const auto vswitch = SwitchOf(group);
        context_.BeginChange();
        auto& target = views_.Of(netstack);
        const std::string chosen = name.empty() ? FreeName(target) : name;
        if (target.LinkByName(chosen)) {
            throw HostCtlException("Netstack " + Quote(netstack) + " has a network device named " + chosen +
                                   " already");
        }
        const std::string end = BridgeEndName(chosen);
        if (views_.Of(Context::kDefaultNetstack).LinkByName(end)) {
            throw HostCtlException("The bridge end of " + chosen + " would be " + end +
                                   ", the name of another network device of netstack " +
                                   Quote(Context::kDefaultNetstack));
        }

        Kernel::VethPair pair;
        pair.end.name = end;
        pair.end.mac = BridgeEndMac(RandomBytes());
        pair.end.mtu = static_cast<unsigned>(vswitch.mtu);
        pair.peer.name = chosen;
        if (!mac.IsZero()) pair.peer.mac = mac.GetStringAddress();
        pair.peer.mtu = mtu;
        pair.peer.rxQueues = rxQueues;
        pair.peer.gsoMaxSize = tsoMss;
        const InterfaceId id{target.Netstack(), chosen};
        Kernel::AddVeth(Kernel::Namespace::Own(), pair, target.Namespace());
        try {
            Kernel::LinkChange up;
            up.up = true;
            Kernel::ChangeLink(target.Namespace(), chosen, up);
            Kernel::ChangeLink(Kernel::Namespace::Own(), end, up);
            switches_.ConnectPort(group, end);
            if (!Kernel::DryRun()) CheckMade(id, pair, group);
        } catch (...) {
            TakeAway(id, end);
            throw;
        }
        ForgetDocumented(id);
        return id;
    }

    void Remove(const InterfaceId& id) override {
        auto end = BridgeEndOf(id);
        if (!end) {
            throw HostCtlException("Tarkon network interface " + Describe(id) +
                                   " was not made on a port group: the Linux host removes only the "
                                   "interfaces it made there (a veth pair whose other end, " +
                                   BridgeEndName(id.name) + ", is a port of a standard switch)");
        }
        context_.BeginChange();
        switches_.DisconnectPort(end->name);
        const auto own = Kernel::Namespace::Own();
        Kernel::DeleteLink(own, end->index, end->name);
        Kernel::Changed();
        if (!Kernel::DryRun() &&
            (views_.Of(Context::kDefaultNetstack).LinkByName(end->name) || View(id).LinkByName(id.name)))
            Differs(id, "it is still there after its removal");
        ForgetDocumented(id);
    }

private:
    NetstackView& View(const InterfaceId& id) { return views_.Of(id.netstack); }

    // ---------------------------------------------------------------- interfaces on port groups

    struct BridgeEnd {
        std::string name;
        int index = 0;
    };

    // The switch of a port group a new interface can attach to: the port group exists and its
    // switch has a free port.
    Backend::SwitchState SwitchOf(const std::string& portGroup) {
        auto group = switches_.FindPortGroup(portGroup);
        if (!group) throw HostCtlException("Port group " + Quote(portGroup) + " does not exist");
        auto vswitch = switches_.Read(group->vswitch);
        if (vswitch.usedPorts >= vswitch.numPorts) {
            throw HostCtlException("Virtual switch " + vswitch.name + " has no free port (" +
                                   std::to_string(vswitch.numPorts) + " ports, all in use)");
        }
        return vswitch;
    }

    // The bridge end of an interface the host made on a port group: the device of the default
    // netstack named after it that is the other end of its veth pair. Nothing for any other
    // device.
    std::optional<BridgeEnd> BridgeEndOf(const InterfaceId& id) {
        const Kernel::Link& link = Require(id);
        if (link.kind != "veth") return std::nullopt;
        const int index = link.index;
        const int peer = link.peer;
        const auto* end = views_.Of(Context::kDefaultNetstack).LinkByName(BridgeEndName(id.name));
        if (!end || end->kind != "veth" || end->index != peer || end->peer != index) return std::nullopt;
        return BridgeEnd{end->name, end->index};
    }

    // The interface whose bridge end is the port, or nothing.
    std::optional<InterfaceId> InterfaceOfPort(const std::string& port) {
        auto name = InterfaceOfBridgeEnd(port);
        if (!name) return std::nullopt;
        for (const auto& netstack : context_.Netstacks()) {
            try {
                InterfaceId id{netstack, *name};
                if (!views_.Of(netstack).IpInterface(*name)) continue;
                if (auto end = BridgeEndOf(id); end && end->name == port) return id;
            } catch (const HostCtlException&) {
                if (netstack == Context::kDefaultNetstack) throw;
            }
        }
        return std::nullopt;
    }

    // The lowest "tknN" that no interface of the host has, no device of the target netstack
    // has, and whose bridge end's name is free.
    std::string FreeName(NetstackView& target) {
        return FreeInterfaceName([&](const std::string& name) {
            if (target.LinkByName(name) ||
                views_.Of(Context::kDefaultNetstack).LinkByName(BridgeEndName(name)))
                return true;
            for (const auto& netstack : context_.Netstacks()) {
                try {
                    if (views_.Of(netstack).LinkByName(name)) return true;
                } catch (const HostCtlException&) {
                    if (netstack == Context::kDefaultNetstack) throw;
                }
            }
            return false;
        });
    }

    static std::array<std::uint8_t, 5> RandomBytes() {
        std::random_device source;
        std::array<std::uint8_t, 5> bytes{};
        for (auto& byte : bytes)
            byte = static_cast<std::uint8_t>(source());
        return bytes;
    }

    // Reads the kernel back after an interface was made: both ends there, as asked, the bridge
    // end connected to the port group.
    void CheckMade(const InterfaceId& id, const Kernel::VethPair& pair, const std::string& group) {
        const auto* link = View(id).LinkByName(id.name);
        if (!link) Differs(id, "it is not there after it was made");
        std::string differs;
        if (link->kind != "veth")
            differs = "it is a " + (link->kind.empty() ? "device" : link->kind + " device");
        else if (link->mtu != pair.peer.mtu)
            differs = "its MTU is " + std::to_string(link->mtu);
        else if (!pair.peer.mac.empty() && link->mac != pair.peer.mac)
            differs = "its MAC address is " + link->mac;
        else if (link->numRxQueues != pair.peer.rxQueues)
            differs = "it has " + std::to_string(link->numRxQueues) + " receive queues";
        else if (link->gsoMaxSize != pair.peer.gsoMaxSize)
            differs = "its TSO MSS is " + std::to_string(link->gsoMaxSize);
        else if (!link->up)
            differs = "it is down";
        else if (!BridgeEndOf(id))
            differs = "its other end is not " + pair.end.name;
        else if (!views_.Of(Context::kDefaultNetstack).LinkByName(pair.end.name)->up)
            differs = "its bridge end " + pair.end.name + " is down";
        if (differs.empty()) {
            const auto ports = switches_.ConnectedPorts();
            auto connected = ports.find(pair.end.name);
            if (connected == ports.end() || connected->second != group)
                differs = "its bridge end " + pair.end.name + " is not connected to port group " + group;
        }
        if (!differs.empty()) Differs(id, differs);
    }

    // Takes an interface made here away again, with its bridge end's connection.
    void TakeAway(const InterfaceId& id, const std::string& end) {
        try {
            switches_.DisconnectPort(end);
        } catch (const HostCtlException& e) {
            context_.Warn(end + " could not be disconnected again: " + e.GetMessage());
        }
        try {
            const auto own = Kernel::Namespace::Own();
            if (auto link = Kernel::FindLink(own, end)) Kernel::DeleteLink(own, link->index, end);
            Kernel::Changed();
        } catch (const HostCtlException& e) {
            context_.Warn(Describe(id) + " could not be removed again: " + e.GetMessage());
        }
    }

    // What the document keeps of an interface (tags, IPv6 addresses kept while IPv6 is off)
    // goes: an interface made anew starts without, one removed leaves nothing behind.
    void ForgetDocumented(const InterfaceId& id) {
        const json& member = context_.GetDocument().Read(kMember);
        auto holds = [&](const char* what) {
            if (!member.is_object()) return false;
            auto byNetstack = member.find(what);
            if (byNetstack == member.end() || !byNetstack->is_object()) return false;
            auto names = byNetstack->find(id.netstack);
            return names != byNetstack->end() && names->is_object() && names->contains(id.name);
        };
        if (!holds("tags") && !holds("keptIpv6")) return;
        json& written = context_.GetDocument().Write(kMember);
        for (const char* what : {"tags", "keptIpv6"}) {
            auto byNetstack = written.find(what);
            if (byNetstack == written.end() || !byNetstack->is_object()) continue;
            auto names = byNetstack->find(id.netstack);
            if (names == byNetstack->end() || !names->is_object()) continue;
            names->erase(id.name);
            if (names->empty()) byNetstack->erase(id.netstack);
            if (byNetstack->empty()) written.erase(what);
        }
    }

    const Kernel::Link& Require(const InterfaceId& id) {
        const auto* link = View(id).IpInterface(id.name);
        if (!link) {
            throw HostCtlException("Tarkon network interface " + Quote(id.name) +
                                   " does not exist on netstack " + Quote(id.netstack));
        }
        return *link;
    }

    [[noreturn]] void Differs(const InterfaceId& id, const std::string& what) {
        throw HostCtlException("The kernel does not hold the change of " + Describe(id) + ": " + what);
    }

    static void AppendInterfaces(NetstackView& view, std::vector<InterfaceId>& out) {
        for (const auto* link : view.IpInterfaces())
            out.push_back({view.Netstack(), link->name});
    }

    // The first IPv4 address of the device: its first primary one, else its first.
    static const Kernel::Address* FirstIpv4(NetstackView& view, int index) {
        const Kernel::Address* first = nullptr;
        for (const auto* address : view.AddressesOf(index)) {
            if (address->family != AF_INET) continue;
            if (!(address->flags & IFA_F_SECONDARY)) return address;
            if (!first) first = address;
        }
        return first;
    }

    static std::vector<Kernel::Address> AddressesOf(NetstackView& view, int family, int index) {
        std::vector<Kernel::Address> out;
        for (const auto* address : view.AddressesOf(index)) {
            if (address->family == family) out.push_back(*address);
        }
        return out;
    }

    // ---------------------------------------------------------------- what Linux cannot do

    void RefuseWhatLinuxCannot(const InterfaceId& id, const IpConfig& current, const IpConfig& wanted) {
        if (wanted.GetUseDhcp() && !current.GetUseDhcp()) {
            throw HostCtlException(
                "DHCP is not available on the Linux host: it needs a DHCP client, which the kernel "
                "does not have, and no client manages " +
                id.name);
        }
        if (!wanted.GetUseDhcp() && current.GetUseDhcp()) {
            throw HostCtlException("The IPv4 address of " + id.name +
                                   " is leased by a DHCP client, which keeps it: "
                                   "stop the client before giving " +
                                   id.name + " another IPv4 setting");
        }
        if (wanted.GetUseDhcp() && wanted.GetDhcpDns() != current.GetDhcpDns()) {
            throw HostCtlException(
                "Whether DNS servers from DHCP are used is the DHCP client's setting, which the "
                "Linux host does not change");
        }
        if (wanted.GetUseIpv6Dhcp() != current.GetUseIpv6Dhcp()) {
            if (wanted.GetUseIpv6Dhcp()) {
                throw HostCtlException(
                    "DHCPv6 is not available on the Linux host: it needs a DHCPv6 client, which the "
                    "kernel does not have, and no client manages " +
                    id.name);
            }
            throw HostCtlException("The IPv6 address of " + id.name +
                                   " is leased by a DHCPv6 client, which keeps it: "
                                   "stop the client to turn DHCPv6 off");
        }
        if (wanted.GetIpv6DhcpDns() != current.GetIpv6DhcpDns()) {
            throw HostCtlException(
                "Whether DNS servers from DHCPv6 or router advertisements are used is up to the "
                "program that reads them, which the Linux host does not change");
        }
        bool ipv6Changes = wanted.GetUseIpv6() != current.GetUseIpv6() ||
                           wanted.GetUseIpv6RouterAdvertised() != current.GetUseIpv6RouterAdvertised();
        if (ipv6Changes && !Require(id).ipv6) {
            throw HostCtlException("IPv6 is not available on " + id.name +
                                   ": the kernel has no IPv6 for it (IPv6 "
                                   "turned off when the kernel started)");
        }
        if (!wanted.GetUseIpv6()) {
            const auto& before = current.GetIpv6Network();
            for (const auto& n : wanted.GetIpv6Network()) {
                if (std::find(before.begin(), before.end(), n) == before.end()) {
                    throw HostCtlException("IPv6 is off on " + id.name +
                                           ": turn it on before giving it the address " +
                                           n.GetStringAddress());
                }
            }
            if (!wanted.GetIpv6Gateway().IsUnspecified() &&
                wanted.GetIpv6Gateway() != current.GetIpv6Gateway()) {
                throw HostCtlException("IPv6 is off on " + id.name +
                                       ": turn it on before giving it the gateway " +
                                       wanted.GetIpv6Gateway().GetStringAddress());
            }
        }
        // The kernel routes to an IPv6 gateway on a subnet of the interface (a link-local one on
        // its link-local subnet).
        const Ipv6Address& gateway6 = wanted.GetIpv6Gateway();
        if (wanted.GetUseIpv6() && !gateway6.IsUnspecified() && gateway6 != current.GetIpv6Gateway()) {
            const auto& networks = wanted.GetIpv6Network();
            bool reaches = std::any_of(networks.begin(), networks.end(), [&](const Ipv6Network& n) {
                return n.GetNetmask() < 128 && n.GetAddress() != gateway6 && n.Contains(gateway6);
            });
            if (!reaches) {
                throw HostCtlException("IPv6 gateway " + gateway6.GetStringAddress() +
                                       " is not on a subnet of " + id.name);
            }
        }
        // A new gateway is a default route through this interface: the kernel refuses it beside
        // a default route of the same metric through another. Say whose it is.
        auto& view = View(id);
        int index = Require(id).index;
        auto check = [&](int family, const std::string& gateway, const std::string& currentGateway,
                         const char* what) {
            if (gateway.empty() || gateway == currentGateway) return;
            // The kernel routes only through a device that is up.
            if (!Require(id).up) {
                throw HostCtlException(id.name +
                                       " is down, and the kernel routes through no interface that is "
                                       "down: enable it before giving it a gateway");
            }
            for (const auto& route : view.DefaultRoutes(family)) {
                if (!route.IsDefault() || route.type != RTN_UNICAST || route.metric != DefaultMetric(family))
                    continue;
                if (route.nexthops.size() == 1 && route.nexthops.front().index == index) continue;
                const auto& hop = route.nexthops.front();
                throw HostCtlException("Netstack " + Quote(id.netstack) + " has its " + what +
                                       " default route through " + view.NameOf(hop.index) +
                                       (hop.gateway.empty() ? "" : " (via " + hop.gateway + ")") +
                                       ": remove it before giving " + id.name + " a gateway");
            }
        };
        if (!wanted.GetUseDhcp())
            check(AF_INET, Text(wanted.GetIpv4Gateway()), Text(current.GetIpv4Gateway()), "IPv4");
        check(AF_INET6, Text(wanted.GetIpv6Gateway()), Text(current.GetIpv6Gateway()), "IPv6");
    }

    static std::uint32_t DefaultMetric(int family) { return family == AF_INET6 ? 1024 : 0; }

    // ---------------------------------------------------------------- carrying it out

    static bool Dynamic6(const IpConfig& config) {
        return config.GetUseIpv6Dhcp() || config.GetUseIpv6RouterAdvertised();
    }

    // Whether the IPv6 default route through the interface must change: to the gateway wanted;
    // without one, none is left but those router advertisements or a lease bring while they
    // are on.
    bool GatewayDiffers6(const InterfaceId& id, const IpConfig& current, const IpConfig& wanted) {
        if (!wanted.GetUseIpv6()) return false;  // the kernel takes the routes of a device without IPv6
        if (!wanted.GetIpv6Gateway().IsUnspecified() || !Dynamic6(wanted))
            return wanted.GetIpv6Gateway() != current.GetIpv6Gateway();
        return DefaultThrough(View(id).DefaultRoutes(AF_INET6), Require(id).index, false) != nullptr;
    }

    bool Differ(const InterfaceId& id, const IpConfig& current, const IpConfig& wanted) {
        if (!wanted.GetUseDhcp()) {
            if (wanted.GetIpv4Address() != current.GetIpv4Address() ||
                wanted.GetIpv4Netmask() != current.GetIpv4Netmask() ||
                wanted.GetIpv4Gateway() != current.GetIpv4Gateway())
                return true;
            // A static setting leaves the device one IPv4 address.
            if (AddressesOf(View(id), AF_INET, Require(id).index).size() >
                (wanted.GetIpv4Address().IsUnspecified() ? 0u : 1u))
                return true;
        }
        if (wanted.GetUseIpv6() != current.GetUseIpv6() ||
            wanted.GetUseIpv6RouterAdvertised() != current.GetUseIpv6RouterAdvertised())
            return true;
        if (GatewayDiffers6(id, current, wanted)) return true;
        const auto& a = wanted.GetIpv6Network();
        const auto& b = current.GetIpv6Network();
        if (a.size() != b.size()) return true;
        for (const auto& n : a) {
            if (std::find(b.begin(), b.end(), n) == b.end()) return true;
        }
        return false;
    }

    void ApplyIpv4(const InterfaceId& id, const IpConfig& wanted) {
        if (wanted.GetUseDhcp()) return;  // the client's (refused above unless nothing changes)
        auto& view = View(id);
        const auto ns = view.Namespace();
        int index = Require(id).index;
        bool none = wanted.GetIpv4Address().IsUnspecified();
        unsigned prefix = 0;
        for (auto bits = wanted.GetIpv4Netmask().GetHostOrder(); bits & 0x80000000u; bits <<= 1)
            ++prefix;
        std::string address = none ? std::string() : wanted.GetIpv4Address().GetStringAddress();

        // The addresses: the wanted one alone, as the device's first.
        auto addresses = AddressesOf(view, AF_INET, index);
        bool keep = !none && !addresses.empty() && addresses.front().address == address &&
                    addresses.front().prefixLength == prefix &&
                    !(addresses.front().flags & IFA_F_SECONDARY) && !IsLeased(addresses.front());
        // Secondary addresses first: a primary one takes its secondaries with it.
        std::stable_partition(addresses.begin(), addresses.end(),
                              [](const Kernel::Address& a) { return (a.flags & IFA_F_SECONDARY) != 0; });
        for (const auto& a : addresses) {
            if (keep && a.address == address && a.prefixLength == prefix && !(a.flags & IFA_F_SECONDARY))
                continue;
            Kernel::Answer answer = Kernel::TryRequest(ns, Kernel::BuildAddressRequest(RTM_DELADDR, a));
            // A secondary address its primary took along is gone already.
            if (answer.error != 0 && answer.error != -EADDRNOTAVAIL) {
                throw HostCtlException("Cannot remove address " + NetworkText(a) + " from " + id.name + ": " +
                                       Kernel::RefusalText(answer));
            }
        }
        if (!none && !keep) {
            Kernel::Address added;
            added.family = AF_INET;
            added.index = index;
            added.address = address;
            added.prefixLength = prefix;
            Kernel::AddAddress(ns, added, id.name);
        }
        SetGateway(id, AF_INET, none ? std::string() : Text(wanted.GetIpv4Gateway()), false);
    }

    void ApplyIpv6(const InterfaceId& id, const IpConfig& current, const IpConfig& wanted) {
        auto& view = View(id);
        const auto ns = view.Namespace();
        const std::string conf = "ipv6/conf/" + id.name + "/";

        if (wanted.GetUseIpv6RouterAdvertised() != current.GetUseIpv6RouterAdvertised()) {
            bool forwarding = Require(id).ipv6 && Require(id).ipv6->forwarding;
            Kernel::WriteSysctl(ns, conf + "accept_ra",
                                wanted.GetUseIpv6RouterAdvertised() ? (forwarding ? "2" : "1") : "0");
            Kernel::Changed();
        }

        if (!wanted.GetUseIpv6()) {
            if (current.GetUseIpv6()) {
                // The kernel drops the addresses of a device whose IPv6 is turned off: the static
                // ones are kept to be given back.
                std::vector<std::string> kept;
                for (const auto& n : current.GetIpv6Network()) {
                    if (n.GetIpv6AddressType() == Ipv6Network::ORIGIN_STATIC)
                        kept.push_back(n.GetStringAddress());
                }
                SetKeptIpv6(id, kept);
                Kernel::WriteSysctl(ns, conf + "disable_ipv6", "1");
                Kernel::Changed();
            }
            return;
        }

        std::vector<Ipv6Network> toAdd;
        bool givenBack = false;
        if (!current.GetUseIpv6()) {
            Kernel::WriteSysctl(ns, conf + "disable_ipv6", "0");
            Kernel::Changed();
            for (const auto& text : KeptIpv6(id)) {
                if (Ipv6Network::IsValidAddressAndNetmask(text)) toAdd.emplace_back(text);
            }
            givenBack = true;
        }
        int index = Require(id).index;
        const auto& before = current.GetIpv6Network();
        for (const auto& n : wanted.GetIpv6Network()) {
            if (std::find(before.begin(), before.end(), n) == before.end() &&
                std::find(toAdd.begin(), toAdd.end(), n) == toAdd.end())
                toAdd.push_back(n);
        }
        if (current.GetUseIpv6()) {
            // Addresses taken from the configuration go.
            const auto& after = wanted.GetIpv6Network();
            for (const auto& n : before) {
                if (std::find(after.begin(), after.end(), n) != after.end()) continue;
                Kernel::DeleteAddress(ns, Ipv6AddressOf(index, n), id.name);
            }
        }
        for (const auto& n : toAdd)
            Kernel::AddAddress(ns, Ipv6AddressOf(index, n), id.name);
        if (givenBack) SetKeptIpv6(id, {});

        std::string gateway = Text(wanted.GetIpv6Gateway());
        SetGateway(id, AF_INET6, gateway, Dynamic6(wanted));
    }

    static Kernel::Address Ipv6AddressOf(int index, const Ipv6Network& n) {
        Kernel::Address address;
        address.family = AF_INET6;
        address.index = index;
        address.address = n.GetAddress().GetStringAddress();
        address.prefixLength = n.GetNetmask();
        return address;
    }

    static std::string Text(const Ipv4Address& a) {
        return a.IsUnspecified() ? std::string() : a.GetStringAddress();
    }
    static std::string Text(const Ipv6Address& a) {
        return a.IsUnspecified() ? std::string() : a.GetStringAddress();
    }

    // Makes the default route of the family through the interface lead to the gateway (none:
    // no default route through it). While addresses come from router advertisements or a lease,
    // the default routes they bring are theirs and stay.
    void SetGateway(const InterfaceId& id, int family, const std::string& gateway, bool learnedStay) {
        auto& view = View(id);
        const auto ns = view.Namespace();
        int index = Require(id).index;
        std::vector<Kernel::Route> through;
        for (const auto& route : view.DefaultRoutes(family)) {
            if (!route.IsDefault() || route.type != RTN_UNICAST || route.nexthops.size() != 1 ||
                route.nexthops.front().index != index)
                continue;
            through.push_back(route);
        }
        bool kept = false;
        for (const auto& route : through) {
            if (!kept && !gateway.empty() && route.nexthops.front().gateway == gateway &&
                route.metric == DefaultMetric(family) && !IsLearned(route)) {
                kept = true;
                continue;
            }
            if (learnedStay && IsLearned(route)) continue;
            Kernel::DeleteRoute(ns, route);
        }
        if (gateway.empty() || kept) return;
        Kernel::Route route;
        route.family = family;
        route.destination = family == AF_INET ? "0.0.0.0" : "::";
        route.protocol = RTPROT_STATIC;
        route.type = RTN_UNICAST;
        route.scope = RT_SCOPE_UNIVERSE;
        route.nexthops.push_back({gateway, index});
        Kernel::AddRoute(ns, route);
    }

    void ReadBack(const InterfaceId& id, const IpConfig& before, const IpConfig& wanted) {
        IpConfig now = GetIpConfig(id);
        if (std::string difference = ConfigDifference(before, wanted, now); !difference.empty())
            Differs(id, difference);
        if (GatewayDiffers6(id, now, wanted)) {
            Differs(id, "its IPv6 gateway is " + (now.GetIpv6Gateway().IsUnspecified()
                                                      ? std::string("none")
                                                      : now.GetIpv6Gateway().GetStringAddress()));
        }
    }

    // ---------------------------------------------------------------- the document

    // What the document keeps of interfaces gone from id's netstack (members named after them)
    // goes with them.
    void PruneGone(json& byName, const InterfaceId& id) {
        auto& view = View(id);
        for (auto it = byName.begin(); it != byName.end();) {
            if (it.key() != id.name && !view.IpInterface(it.key())) {
                it = byName.erase(it);
            } else {
                ++it;
            }
        }
    }

    // The member's tags of an interface (an array of tag names), or null.
    const json& TagsOf(const json& member, const InterfaceId& id) {
        static const json none = json::array();
        if (member.is_null()) return none;
        if (!member.is_object()) context_.GetDocument().Refuse(kMember, "not an object");
        auto tags = member.find("tags");
        if (tags == member.end()) return none;
        if (!tags->is_object()) context_.GetDocument().Refuse(kMember, "\"tags\" is not an object");
        auto netstack = tags->find(id.netstack);
        if (netstack == tags->end()) return none;
        if (!netstack->is_object())
            context_.GetDocument().Refuse(kMember, "tags of netstack " + id.netstack + " are not an object");
        auto names = netstack->find(id.name);
        if (names == netstack->end()) return none;
        if (!names->is_array())
            context_.GetDocument().Refuse(kMember, "tags of " + id.name + " are not a list");
        return *names;
    }

    std::vector<std::string> KeptIpv6(const InterfaceId& id) {
        const json& member = context_.GetDocument().Read(kMember);
        std::vector<std::string> out;
        if (!member.is_object()) return out;
        auto kept = member.find("keptIpv6");
        if (kept == member.end() || !kept->is_object()) return out;
        auto netstack = kept->find(id.netstack);
        if (netstack == kept->end() || !netstack->is_object()) return out;
        auto list = netstack->find(id.name);
        if (list == netstack->end() || !list->is_array()) return out;
        for (const auto& text : *list) {
            if (text.is_string()) out.push_back(text.get<std::string>());
        }
        return out;
    }

    void SetKeptIpv6(const InterfaceId& id, const std::vector<std::string>& addresses) {
        if (KeptIpv6(id) == addresses) return;
        json& member = context_.GetDocument().Write(kMember);
        if (!member.is_object()) member = json::object();
        json& kept = member["keptIpv6"];
        if (!kept.is_object()) kept = json::object();
        json& netstack = kept[id.netstack];
        if (!netstack.is_object()) netstack = json::object();
        PruneGone(netstack, id);
        if (addresses.empty()) {
            netstack.erase(id.name);
        } else {
            netstack[id.name] = addresses;
        }
        if (netstack.empty()) kept.erase(id.netstack);
        if (kept.empty()) member.erase("keptIpv6");
    }

    Context& context_;
    KernelViews views_;
    LinuxSwitches switches_;
    std::unordered_map<std::string, std::pair<unsigned long, IpConfig>> configs_;
};

}  // namespace

std::string ConfigDifference(const IpConfig& before, const IpConfig& wanted, const IpConfig& now) {
    auto text = [](const auto& address, const char* unset) {
        return address.IsUnspecified() ? std::string(unset) : address.GetStringAddress();
    };
    if (!wanted.GetUseDhcp()) {
        if (now.GetIpv4Address() != wanted.GetIpv4Address() ||
            now.GetIpv4Netmask() != wanted.GetIpv4Netmask()) {
            return now.GetIpv4Address().IsUnspecified()
                       ? std::string("it has no IPv4 address")
                       : "its IPv4 address is " + text(now.GetIpv4Address(), "") + " netmask " +
                             text(now.GetIpv4Netmask(), "");
        }
        if (now.GetIpv4Gateway() != wanted.GetIpv4Gateway() && !wanted.GetIpv4Address().IsUnspecified())
            return "its IPv4 gateway is " + text(now.GetIpv4Gateway(), "none");
    }
    if (now.GetUseIpv6() != wanted.GetUseIpv6())
        return std::string("IPv6 is ") + (now.GetUseIpv6() ? "on" : "off");
    if (now.GetUseIpv6RouterAdvertised() != wanted.GetUseIpv6RouterAdvertised())
        return std::string("router advertisements are ") +
               (now.GetUseIpv6RouterAdvertised() ? "accepted" : "ignored");
    // The addresses of an interface whose IPv6 was off are those given back and asked for, which
    // the kernel may still be checking; a change while it stays on is checked address by address.
    if (!wanted.GetUseIpv6() || !before.GetUseIpv6()) return {};
    const auto& have = now.GetIpv6Network();
    const auto& asked = wanted.GetIpv6Network();
    for (const auto& n : asked) {
        if (std::find(have.begin(), have.end(), n) == have.end())
            return "it has no IPv6 address " + n.GetStringAddress();
    }
    for (const auto& n : before.GetIpv6Network()) {
        if (std::find(asked.begin(), asked.end(), n) == asked.end() &&
            std::find(have.begin(), have.end(), n) != have.end())
            return "it still has the IPv6 address " + n.GetStringAddress();
    }
    return {};
}

std::string BridgeEndName(const std::string& interface) {
    return interface + kBridgeEndSuffix;
}

std::optional<std::string> InterfaceOfBridgeEnd(const std::string& port) {
    const std::string suffix = kBridgeEndSuffix;
    if (port.size() <= suffix.size() || port.compare(port.size() - suffix.size(), suffix.size(), suffix) != 0)
        return std::nullopt;
    std::string name = port.substr(0, port.size() - suffix.size());
    if (!Model::IsTknNicName(name)) return std::nullopt;
    return name;
}

std::string BridgeEndMac(const std::array<std::uint8_t, 5>& bytes) {
    std::array<std::uint8_t, 6> all{0xfe, bytes[0], bytes[1], bytes[2], bytes[3], bytes[4]};
    return MacAddress(all).GetStringAddress();
}

std::string FreeInterfaceName(const std::function<bool(const std::string&)>& taken) {
    for (int n = 0; n <= 255; ++n) {
        std::string name = "tkn" + std::to_string(n);
        if (!taken(name)) return name;
    }
    throw HostCtlException("No free Tarkon network interface name: tkn0 to tkn255 are all in use");
}

std::unique_ptr<Backend::Interfaces> MakeInterfaces(Context& context) {
    return std::make_unique<LinuxInterfaces>(context);
}

}  // namespace TknCtl::Linux

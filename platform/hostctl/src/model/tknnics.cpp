#include "model/tknnics.h"

#include "model/dvswitches.h"
#include "model/netstacks.h"
#include "model/values.h"
#include "model/vswitches.h"

namespace TknCtl::Model {

using namespace HostCtl::Network;

const char* TagName(std::uint32_t tag) {
    return tag >= 1 && tag <= 8 ? kTagNames[tag] : nullptr;
}

std::uint32_t TagId(std::string_view name) {
    for (std::uint32_t tag = 1; tag <= 8; ++tag) {
        if (name == kTagNames[tag]) return tag;
    }
    return kInvalidTag;
}

bool IsTknNicName(const std::string& name) {
    if (name.size() < 4 || name.size() > 6 || name.compare(0, 3, "tkn") != 0) return false;
    std::string digits = name.substr(3);
    if (digits.size() > 1 && digits[0] == '0') return false;
    for (char c : digits) {
        if (c < '0' || c > '9') return false;
    }
    return std::stoi(digits) <= 255;
}

const TknNic* TknNicsSection::Find(const std::string& name) const {
    for (const auto& nic : nics) {
        if (nic.name == name) return &nic;
    }
    return nullptr;
}

TknNic* TknNicsSection::Find(const std::string& name) {
    return const_cast<TknNic*>(static_cast<const TknNicsSection*>(this)->Find(name));
}

namespace {

using Json::In;
using Json::Node;

const char* const kConnectionTypes[] = {"none", "portGroup", "dvPort", "opaque"};
const char* const kIpv4Types[] = {"static", "dhcp", "none"};

ConnectionPoint LoadConnection(const In& in) {
    ConnectionPoint c;
    c.type = static_cast<ConnectionPoint::Type>(Json::NameToCode(in.Member("type"), kConnectionTypes));
    switch (c.type) {
        case ConnectionPoint::kPortGroup:
            c.portGroup = in.Str("portGroup");
            break;
        case ConnectionPoint::kDvPort:
            c.dvPort =
                DVPortParam(in.Str("switchUuid"), in.Str("portId"), in.Int<std::uint32_t>("connectionId", 0));
            break;
        case ConnectionPoint::kOpaque:
            c.opaque =
                OpaqueNetworkParam(in.Str("networkId"), in.Str("networkType", ""), in.Str("externalId", ""));
            c.portset = in.Str("portset", "");
            break;
        case ConnectionPoint::kNone:
            break;
    }
    in.Done();
    return c;
}

Node SaveConnection(const ConnectionPoint& c) {
    Node node = {{"type", kConnectionTypes[c.type]}};
    switch (c.type) {
        case ConnectionPoint::kPortGroup:
            node["portGroup"] = c.portGroup;
            break;
        case ConnectionPoint::kDvPort:
            node["switchUuid"] = c.dvPort.GetSwitchUuid();
            node["portId"] = c.dvPort.GetPortId();
            node["connectionId"] = c.dvPort.GetConnectionId();
            break;
        case ConnectionPoint::kOpaque:
            node["networkId"] = c.opaque.GetNetworkId();
            node["networkType"] = c.opaque.GetNetworkType();
            node["externalId"] = c.opaque.GetExternalId();
            node["portset"] = c.portset;
            break;
        case ConnectionPoint::kNone:
            break;
    }
    return node;
}

IpConfig LoadIpConfig(const std::optional<In>& ipv4, const std::optional<In>& ipv6) {
    IpConfig config;
    if (ipv4) {
        std::uint32_t type = ipv4->Has("type") ? Json::NameToCode(ipv4->Member("type"), kIpv4Types) : 0;
        if (auto address = ipv4->OptMember("address")) config.SetIpv4Address(ReadIpv4(*address));
        if (auto netmask = ipv4->OptMember("netmask")) config.SetIpv4Netmask(ReadIpv4(*netmask));
        if (auto gateway = ipv4->OptMember("gateway")) config.SetIpv4Gateway(ReadIpv4(*gateway));
        if (type == 1) config.SetUseDhcp(true);
        if (type == 2) {
            if (!config.GetIpv4Address().IsUnspecified()) ipv4->Fail("type \"none\" with an address");
            config.SetIpv4UseNone();
        }
        config.SetDhcpDns(ipv4->Bool("dhcpDns", false));
        if (type == 0 && !config.GetIpv4Netmask().IsNetmask()) ipv4->Fail("netmask is not contiguous");
        ipv4->Done();
    }
    if (ipv6) {
        config.SetUseIpv6(ipv6->Bool("enabled", false));
        config.SetUseIpv6Dhcp(ipv6->Bool("dhcp", false));
        config.SetUseIpv6RouterAdvertised(ipv6->Bool("routerAdvertised", false));
        config.SetIpv6DhcpDns(ipv6->Bool("dhcpDns", false));
        if (auto gateway = ipv6->OptMember("gateway")) config.SetIpv6Gateway(ReadIpv6(*gateway));
        std::vector<Ipv6Network> networks;
        ipv6->Each("addresses", [&](const In& item) {
            Ipv6Network network = ReadIpv6Network(item.Member("address"));
            network.SetIpv6AddressType(item.Int<int>("origin", Ipv6Network::ORIGIN_STATIC));
            network.SetIpv6AddressStatus(item.Int<int>("status", Ipv6Network::STATUS_PREFERRED));
            item.Done();
            for (const auto& existing : networks) {
                if (existing.GetAddress() == network.GetAddress()) {
                    item.Fail("address " + network.GetAddress().GetStringAddress() + " appears twice");
                }
            }
            networks.push_back(network);
        });
        config.SetIpv6Networks(std::move(networks));
        ipv6->Done();
    }
    return config;
}

Node SaveIpv4(const IpConfig& c) {
    const char* type = c.GetUseDhcp() ? "dhcp" : c.GetIpv4UseNone() ? "none" : "static";
    Node node = {{"type", type}};
    if (!c.GetIpv4UseNone()) {
        node["address"] = c.GetIpv4Address().GetStringAddress();
        node["netmask"] = c.GetIpv4Netmask().GetStringAddress();
        node["gateway"] = c.GetIpv4Gateway().GetStringAddress();
    }
    node["dhcpDns"] = c.GetDhcpDns();
    return node;
}

Node SaveIpv6(const IpConfig& c) {
    Node addresses = Node::array();
    for (const auto& n : c.GetIpv6Network()) {
        addresses.push_back({{"address", n.GetStringAddress()},
                             {"origin", n.GetIpv6AddressType()},
                             {"status", n.GetIpv6AddressStatus()}});
    }
    return Node{{"enabled", c.GetUseIpv6()},
                {"dhcp", c.GetUseIpv6Dhcp()},
                {"routerAdvertised", c.GetUseIpv6RouterAdvertised()},
                {"dhcpDns", c.GetIpv6DhcpDns()},
                {"gateway", c.GetIpv6Gateway().GetStringAddress()},
                {"addresses", std::move(addresses)}};
}

void Load(const In& in, TknNicsSection& section) {
    in.Elements([&](const In& item) {
        TknNic nic;
        nic.name = item.Str("name");
        if (auto connection = item.OptMember("connection")) nic.connection = LoadConnection(*connection);
        nic.netstack = item.Str("netstack", nic.netstack);
        if (auto mac = item.OptMember("mac")) nic.mac = ReadMac(*mac);
        nic.mtu = item.Int<std::uint32_t>("mtu", nic.mtu);
        nic.tsoMss = item.Int<std::uint32_t>("tsoMss", nic.tsoMss);
        nic.rxDispQueues = item.Int<std::uint32_t>("rxDispQueues", nic.rxDispQueues);
        nic.enabled = item.Bool("enabled", true);
        nic.portId = item.OptInt<std::uint32_t>("portId");
        nic.ipConfig = LoadIpConfig(item.OptMember("ipv4"), item.OptMember("ipv6"));
        item.Each("tags", [&](const In& tag) {
            std::uint32_t id = TagId(tag.Str());
            if (id == kInvalidTag) tag.Fail("unknown tag " + Lib::Quote(tag.Str()));
            nic.tags.push_back(id);
        });
        item.Done();
        section.nics.push_back(std::move(nic));
    });
}

Node Save(const TknNicsSection& section) {
    Node out = Node::array();
    for (const auto& nic : section.nics) {
        Node node = {{"name", nic.name},
                     {"connection", SaveConnection(nic.connection)},
                     {"netstack", nic.netstack},
                     {"mac", nic.mac.GetStringAddress()},
                     {"mtu", nic.mtu},
                     {"tsoMss", nic.tsoMss},
                     {"rxDispQueues", nic.rxDispQueues},
                     {"enabled", nic.enabled}};
        if (nic.portId) node["portId"] = *nic.portId;
        node["ipv4"] = SaveIpv4(nic.ipConfig);
        node["ipv6"] = SaveIpv6(nic.ipConfig);
        Node tags = Node::array();
        for (auto tag : nic.tags)
            tags.push_back(TagName(tag) ? TagName(tag) : "");
        node["tags"] = std::move(tags);
        out.push_back(std::move(node));
    }
    return out;
}

void Check(const TknNicsSection& section, Lib::Checker& checker) {
    RequireUnique(
        section.nics, [](const TknNic& n) { return n.name; }, checker, "interface name");
    std::vector<std::string> connections;
    std::vector<std::string> ports;
    for (const auto& nic : section.nics) {
        std::string where = "interface " + Lib::Quote(nic.name) + ": ";
        if (!IsTknNicName(nic.name)) checker.Fail("invalid interface name " + Lib::Quote(nic.name));
        if (!checker.Get<NetstacksSection>().Find(nic.netstack)) {
            checker.Fail(where + "unknown netstack " + Lib::Quote(nic.netstack));
        }
        if (nic.mtu < kMinMtu || nic.mtu > kMaxMtu) {
            checker.Fail(where + "MTU " + std::to_string(nic.mtu) + " outside 1280-9000");
        }
        const auto& c = nic.connection;
        switch (c.type) {
            case ConnectionPoint::kPortGroup:
                if (!checker.Get<VSwitchesSection>().FindPortGroup(c.portGroup)) {
                    checker.Fail(where + "unknown port group " + Lib::Quote(c.portGroup));
                }
                connections.push_back("portGroup " + c.portGroup);
                break;
            case ConnectionPoint::kDvPort: {
                const auto* dvs = checker.Get<DvSwitchesSection>().FindByUuid(c.dvPort.GetSwitchUuid());
                if (!dvs)
                    checker.Fail(where + "unknown distributed switch " +
                                 Lib::Quote(c.dvPort.GetSwitchUuid()));
                if (!dvs->FindPort(c.dvPort.GetPortId())) {
                    checker.Fail(where + "unknown distributed port " + Lib::Quote(c.dvPort.GetPortId()));
                }
                connections.push_back("dvPort " + c.dvPort.GetSwitchUuid() + " " + c.dvPort.GetPortId());
                break;
            }
            case ConnectionPoint::kOpaque:
                connections.push_back("opaque " + c.opaque.GetNetworkId() + " " + c.opaque.GetExternalId());
                break;
            case ConnectionPoint::kNone:
                break;
        }
        if (nic.portId) ports.push_back(std::to_string(*nic.portId));
        RequireUnique(
            nic.tags, [](std::uint32_t t) { return std::to_string(t); }, checker, "tag type");
    }
    RequireUnique(
        connections, [](const std::string& c) { return c; }, checker,
        "connection point (two interfaces on one)");
    RequireUnique(
        ports, [](const std::string& p) { return p; }, checker, "port ID of an interface");
}

}  // namespace

const Lib::SectionKind& TknNicsSection::Kind() {
    static const Json::JsonSection<TknNicsSection> kind("tknnics", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model

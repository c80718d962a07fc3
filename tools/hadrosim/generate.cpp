#include "generate.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <nlohmann/json.hpp>
#include <string>

#include "hostctl/session.h"

namespace Hadro::Sim {

namespace {

using nlohmann::json;

// The host's own limits (see the switch and interface models).
constexpr long kMaxHostPorts = 4608;
constexpr long kMaxTknNics = 256;  // tkn0 to tkn255
// Ports the default host's switches keep in the generated host: they are made smaller so
// that the generated switches get the rest.
constexpr long kDefaultSwitchPorts[] = {16, 8, 16};  // vSwitch0, vSwitch1, dvs-prod

// Port IDs: each generated switch numbers its ports from a block of its own, above the
// default host's blocks.
constexpr std::uint32_t kFirstPortBlock = 0x10000000;
constexpr std::uint32_t kPortBlockSize = 0x1000;

std::string Format(const char* format, long a, long b = 0, long c = 0) {
    char buffer[96];
    std::snprintf(buffer, sizeof(buffer), format, a, b, c);
    return buffer;
}

// Dotted IPv4 text of a 32-bit value.
std::string Ipv4(std::uint32_t value) {
    return Format("%ld.%ld.%ld", static_cast<long>(value >> 24), static_cast<long>((value >> 16) & 0xff),
                  static_cast<long>((value >> 8) & 0xff)) +
           "." + std::to_string(value & 0xff);
}

std::string Mac(std::uint32_t prefix, long index) {
    return Format("02:48:%02lx:%02lx:", static_cast<long>(prefix), (index >> 16) & 0xff) +
           Format("%02lx:%02lx", (index >> 8) & 0xff, index & 0xff);
}

json PortStats(long seed) {
    long packets = 1000 + seed * 37;
    return {{"rxPackets", packets},      {"txPackets", packets - seed},
            {"rxBytes", packets * 700},  {"txBytes", (packets - seed) * 650},
            {"rxBroadcast", seed % 97},  {"txBroadcast", seed % 13},
            {"rxMulticast", seed % 211}, {"txMulticast", seed % 7},
            {"rxDropped", seed % 5},     {"txDropped", 0}};
}

json& Named(json& list, const char* key, const std::string& value) {
    for (auto& item : list) {
        if (item[key] == value) return item;
    }
    throw std::runtime_error("the default host has no " + value);
}

}  // namespace

std::string GenerateHost(double scale) {
    auto count = [scale](long base) { return std::max(1L, std::lround(static_cast<double>(base) * scale)); };
    json doc = json::parse(HostCtl::Lib::HostSession::DefaultDocument());

    // Worlds: one VM world per VM.
    const long vms = count(1000);
    json& worlds = doc["worlds"];
    for (long v = 0; v < vms; ++v)
        worlds.push_back({{"id", 3000000 + v}, {"name", Format("vmm0:vm-%05ld", v)}});

    // Switches share the host's ports: the default switches keep a few, each standard
    // switch has room for its interfaces, the distributed switches take up to 256 each.
    json& vswitches = doc["vswitches"];
    json& dvswitches = doc["dvswitches"];
    Named(vswitches, "name", "vSwitch0")["numPorts"] = kDefaultSwitchPorts[0];
    Named(vswitches, "name", "vSwitch0")["configuredPorts"] = kDefaultSwitchPorts[0];
    Named(vswitches, "name", "vSwitch1")["numPorts"] = kDefaultSwitchPorts[1];
    Named(vswitches, "name", "vSwitch1")["configuredPorts"] = kDefaultSwitchPorts[1];
    Named(dvswitches, "name", "dvs-prod")["numPorts"] = kDefaultSwitchPorts[2];
    Named(dvswitches, "name", "dvs-prod")["configuredPorts"] = kDefaultSwitchPorts[2];
    long portsLeft = kMaxHostPorts - kDefaultSwitchPorts[0] - kDefaultSwitchPorts[1] - kDefaultSwitchPorts[2];

    const long switches = count(64);
    const long groups = std::max(switches, count(1024));
    const long tknnics = std::min(kMaxTknNics, count(256)) - 3;  // tkn0 to tkn2 are there
    const long dvs = count(16);
    const long tknPerSwitch = (std::max(tknnics, 0L) + switches - 1) / switches;
    const long switchPorts = std::max(1L, std::min(tknPerSwitch + 2, (portsLeft - dvs) / switches));
    portsLeft -= switchPorts * switches;
    const long dvPorts = std::max(1L, std::min(256L, portsLeft / dvs));

    json templateSwitch = Named(vswitches, "name", "vSwitch1");
    templateSwitch["uplinks"] = json::array();
    templateSwitch["policy"]["teaming"]["uplinkOrder"] = json::array();
    templateSwitch["policy"]["teaming"]["maxActive"] = 0;
    templateSwitch["mtu"] = 1500;
    std::vector<long> usedPorts(static_cast<std::size_t>(switches), 0);
    std::vector<std::uint32_t> nextPort(static_cast<std::size_t>(switches + dvs));
    for (long i = 0; i < switches + dvs; ++i)
        nextPort[static_cast<std::size_t>(i)] =
            kFirstPortBlock + static_cast<std::uint32_t>(i) * kPortBlockSize + 2;
    for (long s = 0; s < switches; ++s) {
        json sw = templateSwitch;
        sw["name"] = Format("vSwitch%ld", s + 2);
        sw["numPorts"] = switchPorts;
        sw["configuredPorts"] = switchPorts;
        sw["usedPorts"] = 0;
        sw["portGroups"] = json::array();
        vswitches.push_back(std::move(sw));
    }
    for (long g = 0; g < groups; ++g) {
        json group = {
            {"name", Format("PG-%05ld", g)},
            {"vlanId", 100 + g % 3900},
            {"policy",
             {{"teaming", json::object()}, {"security", json::object()}, {"shaping", json::object()}}},
            {"activeClients", 0}};
        if (g % 4 == 1) group["policy"]["security"]["allowPromiscuous"] = true;
        vswitches[static_cast<std::size_t>(2 + g % switches)]["portGroups"].push_back(std::move(group));
    }

    // Tarkon interfaces tkn3 and up, one on the first port group of each switch in turn;
    // each takes a port of its switch.
    json& nics = doc["tknnics"];
    json& ports = doc["ports"];
    json templateNic = Named(nics, "name", "tkn1");
    for (long n = 0; n < tknnics; ++n) {
        const long s = n % switches;
        json& sw = vswitches[static_cast<std::size_t>(2 + s)];
        json& group = sw["portGroups"][static_cast<std::size_t>(n / switches)];
        const std::string name = "tkn" + std::to_string(n + 3);
        const std::uint32_t address = (10u << 24) | (static_cast<std::uint32_t>(n) << 8) | 10u;
        const std::uint32_t portId = nextPort[static_cast<std::size_t>(s)]++;
        json nic = templateNic;
        nic["name"] = name;
        nic["connection"] = {{"type", "portGroup"}, {"portGroup", group["name"]}};
        nic["netstack"] = "defaultTcpipStack";
        nic["mac"] = Mac(0x45, n);
        nic["mtu"] = 1500;
        nic["rxDispQueues"] = 1;
        nic["portId"] = portId;
        nic["ipv4"] = {{"type", "static"},
                       {"address", Ipv4(address)},
                       {"netmask", "255.255.255.0"},
                       {"gateway", Ipv4(address - 9)},
                       {"dhcpDns", false}};
        nic["tags"] = json::array();
        nics.push_back(std::move(nic));
        group["activeClients"] = 1;
        sw["usedPorts"] = ++usedPorts[static_cast<std::size_t>(s)];
        ports.push_back({{"id", portId},
                         {"switch", sw["name"]},
                         {"type", "tknnic"},
                         {"portGroup", group["name"]},
                         {"client", name},
                         {"worldId", 0},
                         {"mac", Mac(0x45, n)},
                         {"ipv4", Ipv4(address)},
                         {"teamUplink", ""},
                         {"stats", PortStats(n)},
                         {"filters", json::array()}});
    }

    // Distributed switches: their ports in distributed port groups of 64; VMs take the
    // ports in turn, as long as there are ports.
    json templateDvs = Named(dvswitches, "name", "dvs-prod");
    templateDvs["uplinks"] = json::array();
    templateDvs["lacp"] = {
        {"form", "none"}, {"uplinks", json::array()}, {"lags", json::array()}, {"status", json::array()}};
    templateDvs["mtu"] = 1500;
    for (long d = 0; d < dvs; ++d) {
        json sw = templateDvs;
        sw["name"] = Format("dvs-%03ld", d);
        sw["uuid"] = Format("50 1e 3b 0c 7a 9d 41 2f-8e 6d 1a 2b 3c 4d %02lx %02lx", d >> 8, d & 0xff);
        sw["numPorts"] = dvPorts;
        sw["configuredPorts"] = dvPorts;
        sw["ports"] = json::array();
        long used = 0;
        for (long p = 0; p < dvPorts; ++p) {
            const long vm = p * dvs + d;  // VMs spread over the switches
            const bool inUse = vm < vms;
            const long connection = 1800000000L + d * 4096 + p;
            sw["ports"].push_back(
                {{"id", std::to_string(p)},
                 {"portgroupId", Format("dvportgroup-%ld", 1000 + d * 64 + p / 64)},
                 {"inUse", inUse},
                 {"clients", inUse ? json::array({Format("vm-%05ld.eth0", vm)}) : json::array()},
                 {"connectionId", inUse ? connection : 0},
                 {"lacp", {{"enabled", false}, {"mode", 0}}}});
            if (!inUse) continue;
            ++used;
            const std::uint32_t address = (100u << 24) | (static_cast<std::uint32_t>(vm) << 8) | 20u;
            ports.push_back({{"id", nextPort[static_cast<std::size_t>(switches + d)]++},
                             {"switch", sw["name"]},
                             {"type", "vm"},
                             {"dvPortId", std::to_string(p)},
                             {"client", Format("vm-%05ld.eth0", vm)},
                             {"worldId", 3000000 + vm},
                             {"mac", Mac(0x46, vm)},
                             {"ipv4", Ipv4(address)},
                             {"teamUplink", ""},
                             {"stats", PortStats(vm)},
                             {"filters", json::array()}});
        }
        sw["usedPorts"] = used;
        dvswitches.push_back(std::move(sw));
    }

    // Firewall rulesets of ten port rules each.
    json& rulesets = doc["firewall"]["rulesets"];
    const long sets = count(200);
    for (long r = 0; r < sets; ++r) {
        json rules = json::array();
        for (long k = 0; k < 10; ++k) {
            const long port = 10000 + (r * 10 + k) % 50000;
            rules.push_back({{"portType", k % 3 == 2 ? "src" : "dst"},
                             {"portBegin", port},
                             {"portEnd", port + k % 3},
                             {"direction", k % 2 ? "outbound" : "inbound"},
                             {"protocol", k % 4 == 3 ? "udp" : "tcp"}});
        }
        const bool all = r % 3 != 0;
        rulesets.push_back({{"id", Format("service%04ld", r)},
                            {"enabled", r % 5 != 4},
                            {"allowedAll", all},
                            {"allowedIps", all ? json::array()
                                               : json::array({Ipv4((198u << 24) | (18u << 16) |
                                                                   static_cast<std::uint32_t>(r)),
                                                              "2001:db8:99::/64"})},
                            {"rules", std::move(rules)},
                            {"clientCount", 0}});
    }

    // Routes, neighbours and connections of the default netstack, on the new interfaces
    // (or tkn0 when there are none).
    auto nicName = [&](long i) {
        return tknnics > 0 ? "tkn" + std::to_string(3 + i % tknnics) : std::string("tkn0");
    };
    auto nicAddress = [&](long i) {
        return tknnics > 0 ? (10u << 24) | (static_cast<std::uint32_t>(i % tknnics) << 8) | 10u
                           : (192u << 24) | (2u << 8) | 10u;
    };
    json& stackRoutes = Named(doc["routes"], "netstack", "defaultTcpipStack")["ipv4"];
    const long routes = count(2000);
    for (long r = 0; r < routes; ++r) {
        const std::uint32_t network = (172u << 24) | (static_cast<std::uint32_t>(16 * 256 + r) << 8);
        stackRoutes.push_back({{"network", Ipv4(network) + "/24"},
                               {"gateway", Ipv4(nicAddress(r) - 9)},
                               {"interface", nicName(r)},
                               {"source", "MANUAL"}});
    }
    json& neighbours = Named(doc["neighbors"], "netstack", "defaultTcpipStack")["ipv4"];
    const long neighbourCount = count(5000);
    for (long n = 0; n < neighbourCount; ++n) {
        const std::uint32_t address = (11u << 24) | static_cast<std::uint32_t>(n + 1);
        neighbours.push_back({{"address", Ipv4(address)},
                              {"mac", Mac(0x47, n)},
                              {"interface", nicName(n)},
                              {"expiry", n % 1200},
                              {"state", 0},
                              {"type", n % 10 == 0 ? "Static" : "Dynamic"}});
    }
    json& connections = Named(doc["connections"], "netstack", "defaultTcpipStack")["connections"];
    const long connectionCount = count(10000);
    for (long c = 0; c < connectionCount; ++c) {
        const bool tcp = c % 4 != 3;
        connections.push_back(
            {{"protocol", tcp ? "tcp" : "udp"},
             {"recvQ", c % 3},
             {"sendQ", c % 7 * 12},
             {"localAddress", Ipv4(nicAddress(c))},
             {"localPort", tcp ? 443 : 1024 + c % 60000},
             {"foreignAddress", Ipv4((198u << 24) | (19u << 16) | static_cast<std::uint32_t>(c % 65536))},
             {"foreignPort", 1024 + (c * 7) % 60000},
             {"state", tcp ? 4 : 0},
             {"worldId", 3000000 + c % vms},
             {"ccAlgo", tcp ? (c % 2 ? "cubic" : "newreno") : ""}});
    }
    return doc.dump();
}

}  // namespace Hadro::Sim

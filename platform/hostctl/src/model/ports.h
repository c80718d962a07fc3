// Section "ports": the virtual ports of all switches (standard and distributed) with their
// clients, addresses and counters.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "core/section.h"
#include "hostctl/network/types.h"

namespace TknCtl::Model {

// Port types (codes as the library reports them).
inline const char* const kPortTypes[] = {nullptr, "vm", "tknnic", "internal", "uplink"};
enum PortType : std::uint32_t { kPortVm = 1, kPortTknNic = 2, kPortInternal = 3, kPortUplink = 4 };

struct PortStats {
    std::uint64_t rxPackets = 0;
    std::uint64_t txPackets = 0;
    std::uint64_t rxBytes = 0;
    std::uint64_t txBytes = 0;
    std::uint64_t rxBroadcast = 0;
    std::uint64_t txBroadcast = 0;
    std::uint64_t rxMulticast = 0;
    std::uint64_t txMulticast = 0;
    std::uint64_t rxDropped = 0;
    std::uint64_t txDropped = 0;
};

struct FilterStats {
    std::string name;
    bool valid = true;
    bool direction = false;      // false: as the port receives
    bool extendedValid = false;  // the last five counters are kept
    std::uint64_t packetsIn = 0;
    std::uint64_t packetsOut = 0;
    std::uint64_t packetsDropped = 0;
    std::uint64_t packetsFiltered = 0;
    std::uint64_t packetsFaulted = 0;
    std::uint64_t packetsQueued = 0;
    std::uint64_t packetsInjected = 0;
    std::uint64_t packetErrors = 0;
};

struct Port {
    std::uint32_t id = 0;
    std::string switchName;  // a standard or distributed switch
    std::uint32_t type = kPortVm;
    std::string portGroup;      // standard switch
    std::string dvPortId;       // distributed switch
    std::string client;         // "web-01.eth0", "tkn0", "vmnic0"
    std::uint32_t worldId = 0;  // the client's world; 0: none (not a VM)
    HostCtl::Network::MacAddress mac;
    HostCtl::Network::Ipv4Address ipv4;
    std::string teamUplink;  // the physical NIC the port's traffic leaves by
    PortStats stats;
    std::vector<FilterStats> filters;
};

struct PortsSection {
    static const Lib::SectionKind& Kind();
    std::vector<Port> ports;

    const Port* Find(std::uint32_t id) const;
    Port* Find(std::uint32_t id);
};

}  // namespace TknCtl::Model

// Section "tknnics": the host's own (Tarkon) network interfaces.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "core/section.h"
#include "hostctl/network/types.h"

namespace TknCtl::Model {

constexpr std::uint32_t kMinMtu = 1280;
constexpr std::uint32_t kMaxMtu = 9000;

// Interface tag types 1..8 and their names; 9 stands for "no such tag".
constexpr std::uint32_t kInvalidTag = 9;
inline const char* const kTagNames[] = {nullptr,
                                        "Management",
                                        "Glidex",
                                        "faultToleranceLogging",
                                        "PellixReplication",
                                        "PellixReplicationNFC",
                                        "PellixProvisioning",
                                        "Storage",
                                        "StorageWitness"};
// The name of a tag type, or nullptr.
const char* TagName(std::uint32_t tag);
// The type of a tag name, or kInvalidTag.
std::uint32_t TagId(std::string_view name);

// Where an interface attaches.
struct ConnectionPoint {
    enum Type : std::uint32_t { kNone = 0, kPortGroup = 1, kDvPort = 2, kOpaque = 3 };
    Type type = kNone;
    std::string portGroup;                        // kPortGroup
    HostCtl::Network::DVPortParam dvPort;         // kDvPort
    HostCtl::Network::OpaqueNetworkParam opaque;  // kOpaque
    std::string portset;                          // kOpaque: the opaque switch
};

struct TknNic {
    std::string name;  // "tkn0" .. "tkn255"
    ConnectionPoint connection;
    std::string netstack = "defaultTcpipStack";
    HostCtl::Network::MacAddress mac;
    std::uint32_t mtu = 1500;
    std::uint32_t tsoMss = 65535;
    std::uint32_t rxDispQueues = 1;
    bool enabled = true;
    std::optional<std::uint32_t> portId;  // the virtual port it uses (section "ports")
    HostCtl::Network::IpConfig ipConfig;
    std::vector<std::uint32_t> tags;  // in the order they were set
};

struct TknNicsSection {
    static const Lib::SectionKind& Kind();
    std::vector<TknNic> nics;

    const TknNic* Find(const std::string& name) const;
    TknNic* Find(const std::string& name);
};

// True for "tkn0" .. "tkn255" (no leading zeros).
bool IsTknNicName(const std::string& name);

}  // namespace TknCtl::Model

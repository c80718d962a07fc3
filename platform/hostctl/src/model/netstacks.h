// Section "netstacks": the network stack instances (Tarkon TCP/IP stacks).
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "core/section.h"

namespace TknCtl::Model {

// State of a netstack that exists in the kernel; any other state means configured only.
constexpr std::uint32_t kNetstackEnabled = 4660;
constexpr std::uint32_t kNetstackConfigured = 0;
// The congestion-control algorithms a netstack may use.
inline const char* const kCongestionControlAlgorithms[] = {"newreno", "cubic"};

struct Netstack {
    std::string key;   // "defaultTcpipStack"
    std::string name;  // display name
    std::uint32_t state = kNetstackEnabled;
    std::uint32_t maxConnections = 11000;         // configured
    std::uint32_t currentMaxConnections = 11000;  // in force
    std::string congestionControl = "newreno";
    bool ipv6Enabled = true;         // configured
    bool currentIpv6Enabled = true;  // in force
};

struct NetstacksSection {
    static const Lib::SectionKind& Kind();
    std::vector<Netstack> netstacks;

    const Netstack* Find(const std::string& key) const;
    Netstack* Find(const std::string& key);
};

}  // namespace TknCtl::Model

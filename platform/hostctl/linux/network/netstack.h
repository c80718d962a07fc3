// The netstacks of the Linux host (network/netstack.cpp): what the area keeps in the host's
// document and how it speaks of congestion-control algorithms, as plain values.
//
// Member "netstacks" of the document, one object per netstack key:
//
//     "netstacks": {
//       "glidex": {"name": "Glidex stack"},
//       "backup": {"name": "backup", "disabled": true, "maxConnections": 11000,
//                  "congestionControl": "newreno", "ipv6Enabled": true}
//     }
//
// A display name is all the kernel cannot hold for a netstack whose namespace exists; a
// netstack kept disabled also has the settings its namespace is made with when it is enabled.
#pragma once

#include <cstdint>
#include <map>
#include <string>

#include <nlohmann/json_fwd.hpp>

namespace TknCtl::Linux {

struct NetstackRecord {
    std::string name;       // display name; empty: the key
    bool disabled = false;  // kept in the document only; the settings below hold then
    std::uint32_t maxConnections = 0;
    std::string congestionControl;  // the host's name ("newreno")
    bool ipv6Enabled = false;

    bool operator==(const NetstackRecord&) const = default;
};
using NetstackRecords = std::map<std::string, NetstackRecord>;

// The member as read; throws std::invalid_argument saying what is wrong with it. A null member
// is empty.
NetstackRecords ParseNetstackRecords(const nlohmann::json& member);
nlohmann::json NetstackRecordsJson(const NetstackRecords& records);

// The host calls the kernel's "reno" "newreno"; every other algorithm has the kernel's name.
std::string KernelAlgorithm(const std::string& hostName);
std::string HostAlgorithm(const std::string& kernelName);
// A kernel list of algorithms ("reno bbr", as the sysctls give it) in the host's names:
// "newreno, bbr".
std::string HostAlgorithmList(const std::string& kernelList);

// Why the kernel bars an algorithm (the host's name) in a netstack, given what its
// tcp_allowed_congestion_control and tcp_available_congestion_control say; empty when
// neither bars it.
std::string AlgorithmRefusal(const std::string& netstack, const std::string& algorithm,
                             const std::string& allowed, const std::string& available);

}  // namespace TknCtl::Linux

// Network policies of standard switches and port groups: NIC teaming (failover), security
// and traffic shaping. Every field is optional: a field that is present is "set". On a
// switch all fields are normally set; on a port group a set field overrides the switch.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include <nlohmann/json_fwd.hpp>

namespace TknCtl::Json {
class In;
}

namespace TknCtl::Model {

// Teaming policy types: 1 hash of source and destination IP, 2 source MAC, 3 originating
// port ID, 4 explicit failover order.
struct LinkCriteria {
    std::optional<bool> beacon;
};

struct TeamingPolicy {
    std::optional<std::uint32_t> policy;
    std::optional<bool> notifySwitches;
    std::optional<bool> rollingRestoration;  // failback is its negation
    std::optional<LinkCriteria> linkCriteria;
    std::optional<std::vector<std::string>> uplinkOrder;  // the first maxActive are active
    std::optional<std::int32_t> maxActive;
};

struct SecurityPolicy {
    std::optional<bool> allowPromiscuous;
    std::optional<bool> allowMacChange;
    std::optional<bool> allowForgedTransmits;
};

struct ShapingPolicy {
    std::optional<bool> enabled;
    std::optional<std::uint64_t> averageBps;  // bits per second
    std::optional<std::uint64_t> peakBps;
    std::optional<std::uint64_t> burstSize;  // bytes
};

struct Policy {
    TeamingPolicy teaming;
    SecurityPolicy security;
    ShapingPolicy shaping;
};

// The offloads a switch uses on its uplinks.
struct Capabilities {
    std::optional<bool> csumOffload;
    std::optional<bool> tcpSegmentation;
    std::optional<bool> zeroCopyXmit;
};

// The fields set in over laid over base, field by field (a port group's overrides over its
// switch's policy; the changed fields of an update over the stored policy).
TeamingPolicy Overlay(const TeamingPolicy& base, const TeamingPolicy& over);
SecurityPolicy Overlay(const SecurityPolicy& base, const SecurityPolicy& over);
ShapingPolicy Overlay(const ShapingPolicy& base, const ShapingPolicy& over);
Capabilities Overlay(const Capabilities& base, const Capabilities& over);

Policy LoadPolicy(const Json::In& in);
nlohmann::ordered_json SavePolicy(const Policy& policy);
Capabilities LoadCapabilities(const Json::In& in);
nlohmann::ordered_json SaveCapabilities(const Capabilities& capabilities);

}  // namespace TknCtl::Model

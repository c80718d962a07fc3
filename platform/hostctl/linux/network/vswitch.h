// The standard switches of the Linux host (network/vswitch.cpp, vswitch_portgroup.cpp,
// vswitch_policy.cpp), its distributed switches (dvswitch.cpp) and ENS (ens.cpp).
//
// A standard switch is a bridge of the namespace the program runs in (the default netstack's).
// Bridges of other netstacks are left out: uplinks are physical NICs, which live in the
// default netstack, switch names are the host's (no command names a netstack), and a bridge
// inside another netstack is that netstack's own plumbing. The switch's uplinks are its ports
// that are physical NICs; its other ports (the bridge ends of interfaces, a virtual machine's
// tap) are its virtual ports. Its MTU is the bridge's.
//
// What the kernel has no notion of lives in member "vswitches" of the host's document, one
// object per bridge that the host changed:
//
//     "vswitches": {
//       "br0": {"ports": 128, "cdpStatus": 1,
//               "beacon": {"enabled": false, "interval": 1, "threshold": 3, "requiredBy": []},
//               "policy": {"teaming": {"loadBalancing": 3, "notifySwitches": true,
//                                      "rollingRestoration": false, "linkCriteria": {"beacon": true}},
//                          "security": {"allowPromiscuous": false, "allowMacChange": false,
//                                       "allowForgedTransmits": false},
//                          "shaping": {"enabled": false, "averageBps": 100000000,
//                                      "peakBps": 100000000, "burstSize": 104857600}},
//               "portGroups": [{"name": "VM Network", "vlanId": 0, "policy": {}, "ports": ["vp0"]}]}
//     }
//
// A policy member holds the fields that are set (a port group's: those it overrides). A port
// group's "ports" are the bridge ports connected to it (the bridge ends of interfaces); a
// bridge the document does not name has the host's defaults. Records of bridges that are gone,
// and ports that left their bridge, are dropped when the document is next written.
//
// How the policies become the kernel's:
// - security, on every virtual port (an uplink carries every station's frames and keeps the
//   bridge's defaults): promiscuous mode refused = unknown unicast is not flooded to the port
//   (flood off); allowing it is refused, since a bridge cannot give a port the frames it forwards
//   to other ports. MAC changes refused = the bridge learns no address from the port (learning
//   off); forged transmits refused = only the port's own client address passes (locked port).
//   Either needs the client's address as a static forwarding entry of the port: the MAC of the
//   port's veth peer (an interface, in whichever netstack it lies); a port of another kind is
//   refused then, since its client's address is unknown to the host.
// - shaping, on every port (uplinks and virtual ports, ports added later included): a root
//   token bucket with rate = average, peak rate = peak (none when equal to the average; a peak
//   below the average is refused), burst = the burst size in bytes. A root discipline that the
//   administrator put on a port (any but the kernel's own and a token bucket) is not replaced.
// - teaming: the policy is kept in the document; a bridge forwards on every uplink it has, so
//   a switch carries one uplink at most and that uplink is active: more, or a standby or unused
//   one, needs the bonding driver. Beacon probing is refused: a bridge knows an uplink's
//   failure by its link state only.
// - VLAN IDs: 0 (none) needs nothing; 4095 (every VLAN) is what a bridge without VLAN
//   filtering does; 1 to 4094 need bridge VLAN filtering (the port group's ports untagged in
//   its VLAN, the uplinks tagged in every VLAN of the switch's port groups); where the kernel
//   lacks it they are refused.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include <nlohmann/json_fwd.hpp>

#include "backend/switches.h"
#include "kernel/bridges.h"
#include "kernel/qdiscs.h"

namespace TknCtl::Linux {

struct Config;
class Context;

// ---------------------------------------------------------------- the document

struct PortGroupRecord {
    std::string name;
    std::uint16_t vlanId = 0;
    Backend::SwitchPolicy policy;    // the port group's overrides
    std::vector<std::string> ports;  // bridge ports connected to it

    bool operator==(const PortGroupRecord&) const = default;
};

struct SwitchRecord {
    std::uint32_t ports = 128;  // configured port count
    std::uint32_t cdpStatus = 1;
    bool beaconEnabled = false;
    std::uint32_t beaconInterval = 1;
    std::uint32_t beaconThreshold = 3;
    std::vector<std::string> beaconRequiredBy;
    Backend::SwitchPolicy policy;  // the stored policy
    std::vector<PortGroupRecord> portGroups;

    bool operator==(const SwitchRecord&) const = default;
    const PortGroupRecord* FindPortGroup(const std::string& name) const;
    PortGroupRecord* FindPortGroup(const std::string& name);
};
using SwitchRecords = std::map<std::string, SwitchRecord>;

// The member as read; throws std::invalid_argument saying what is wrong with it. A null member
// is empty.
SwitchRecords ParseSwitchRecords(const nlohmann::json& member);
nlohmann::json SwitchRecordsJson(const SwitchRecords& records);

// Whether text can name a network device (1 to 15 bytes, no '/', ':' or blank, not "." or
// "..").
bool IsDeviceName(const std::string& name);

// ---------------------------------------------------------------- physical NICs

// (Which interfaces are physical NICs: IsPhysicalNic, network/pnic.h.)

// Why a NIC cannot become a bridge port, whatever the bridge: it is a port of a master (a
// bridge: another switch), or it carries a device that takes its frames before any bridge
// could (macvlan, ipvlan); empty when nothing holds it.
std::string NicHolder(const std::vector<Kernel::BridgeLink>& links, const Kernel::BridgeLink& nic);

// ---------------------------------------------------------------- policies in kernel terms

// The port flags a virtual port takes under a security policy in force; the text of the
// refusal when a bridge cannot carry it out (empty when it can). needsClientMac: the port
// needs its client's address as a static forwarding entry.
struct PortSecurityFlags {
    Kernel::PortFlagsChange flags;
    bool needsClientMac = false;
};
std::string SecurityRefusal(const HostCtl::Network::PortSecurityPolicy& policy);
PortSecurityFlags SecurityFlags(const HostCtl::Network::PortSecurityPolicy& policy);

// The token bucket of a port of MTU mtu under a shaping policy in force that is enabled, or
// the refusal of the policy (its text in refusal).
std::optional<Kernel::TokenBucket> ShapingBucket(const HostCtl::Network::ShapingPolicy& policy, unsigned mtu,
                                                 std::string& refusal);

// The refusal of a teaming policy in force on a switch with those uplinks (empty when a
// bridge can carry it out); bonding: whether the kernel has the bonding driver.
std::string TeamingRefusal(const HostCtl::Network::NicTeamingPolicy& policy,
                           const std::vector<std::string>& uplinks, bool bonding);

// What a port group's policy in force is: its overrides over its switch's stored policy.
HostCtl::Network::PortSecurityPolicy Overlay(const HostCtl::Network::PortSecurityPolicy& base,
                                             const HostCtl::Network::PortSecurityPolicy& over);
HostCtl::Network::ShapingPolicy Overlay(const HostCtl::Network::ShapingPolicy& base,
                                        const HostCtl::Network::ShapingPolicy& over);
HostCtl::Network::NicTeamingPolicy Overlay(const HostCtl::Network::NicTeamingPolicy& base,
                                           const HostCtl::Network::NicTeamingPolicy& over);

// The VLANs of a port of a port group with that VLAN ID, and of an uplink of a switch whose
// port groups have those VLAN IDs, on a bridge that filters VLANs with that default PVID.
std::vector<Kernel::PortVlan> PortGroupVlans(std::uint16_t vlanId, std::uint16_t defaultPvid);
std::vector<Kernel::PortVlan> UplinkVlans(const std::vector<std::uint16_t>& vlanIds,
                                          std::uint16_t defaultPvid);

// ---------------------------------------------------------------- the area

class LinuxSwitches final : public Backend::Switches {
public:
    explicit LinuxSwitches(Context& context);

    // vswitch.cpp
    std::vector<std::string> List() override;
    bool Has(const std::string& name) override;
    Backend::SwitchState Read(const std::string& name) override;
    Backend::SwitchPolicy ReadPolicy(const std::string& name) override;
    void Add(const std::string& name, std::uint32_t numPorts, const Backend::SwitchPolicy& policy) override;
    void Remove(const std::string& name) override;
    void SetMtu(const std::string& name, int mtu) override;
    void SetCdpStatus(const std::string& name, std::uint32_t status) override;
    void AddUplink(const std::string& name, const std::string& nic) override;
    void RemoveUplink(const std::string& name, const std::string& nic) override;
    std::vector<std::string> PhysicalNics() override;

    // vswitch_policy.cpp
    void WriteTeaming(const std::string& name, const HostCtl::Network::NicTeamingPolicy& policy) override;
    void WriteSecurity(const std::string& name, const HostCtl::Network::PortSecurityPolicy& policy) override;
    void WriteShaping(const std::string& name, const HostCtl::Network::ShapingPolicy& policy) override;
    void WritePortGroupTeaming(const std::string& name,
                               const HostCtl::Network::NicTeamingPolicy& own) override;
    void WritePortGroupSecurity(const std::string& name,
                                const HostCtl::Network::PortSecurityPolicy& own) override;
    void WritePortGroupShaping(const std::string& name, const HostCtl::Network::ShapingPolicy& own) override;

    // vswitch_portgroup.cpp
    std::vector<Backend::PortGroupState> PortGroups() override;
    std::optional<Backend::PortGroupState> FindPortGroup(const std::string& name) override;
    Backend::SwitchPolicy ReadPortGroupPolicy(const std::string& name) override;
    void AddPortGroup(const std::string& vswitch, const std::string& name) override;
    void RemovePortGroup(const std::string& vswitch, const std::string& name) override;
    void SetVlanId(const std::string& portGroup, std::uint16_t vlanId) override;

    // dvswitch.cpp, ens.cpp
    std::vector<std::string> DistributedSwitches() override;
    void RequireEns() override;

    // For the interfaces area (vswitch_portgroup.cpp), whose interfaces on a port group are
    // veth pairs: the bridge end `port` joins the bridge of the port group's switch, takes the
    // port group's VLAN, security and shaping, and is kept as the port group's. Refused (with
    // nothing changed) when the host cannot carry that out. Called again for a connected port
    // (after its interface's MAC address changed, say), it carries the policies out anew.
    void ConnectPort(const std::string& portGroup, const std::string& port);
    // A port leaves its port group and its bridge, without the switch's shaping (before the
    // interface's veth pair goes). Nothing when it is no port group's.
    void DisconnectPort(const std::string& port);
    // The ports connected to port groups now (kept as a port group's, and a port of its
    // switch's bridge), with the port group of each.
    std::map<std::string, std::string> ConnectedPorts();

private:
    // The namespace's links at one moment, as a switch sees them.
    struct View {
        std::vector<Kernel::BridgeLink> links;
        const Kernel::BridgeLink* Find(const std::string& name) const;
        const Kernel::BridgeLink* ByIndex(int index) const;
        std::vector<const Kernel::BridgeLink*> PortsOf(const Kernel::BridgeLink& bridge) const;
    };
    View Look() const;
    bool IsNic(const Kernel::BridgeLink& link) const;
    // The bridge of a switch; throws HostCtlException("Virtual switch NAME does not exist").
    const Kernel::BridgeLink& Bridge(const View& view, const std::string& name) const;
    std::vector<std::string> UplinkNames(const View& view, const Kernel::BridgeLink& bridge) const;

    // The document: every record (a bridge without one has the host's defaults).
    SwitchRecords Records();
    SwitchRecord RecordOf(const SwitchRecords& records, const std::string& name) const;
    void Store(SwitchRecords records, const View& view);
    // The port group of that name and its switch; throws HostCtlException("Port group NAME
    // does not exist").
    std::pair<std::string, PortGroupRecord> Group(const View& view, const SwitchRecords& records,
                                                  const std::string& name) const;

    // Carries out a switch's policies on its ports (all of them, or the one named), and reads
    // the kernel back.
    void ApplySecurity(const View& view, const Kernel::BridgeLink& bridge, const SwitchRecord& record,
                       const std::string& only = {});
    void ApplyShaping(const View& view, const Kernel::BridgeLink& bridge, const SwitchRecord& record,
                      const std::string& only = {});
    void ApplyVlans(const View& view, const Kernel::BridgeLink& bridge, const SwitchRecord& record);
    void CheckTeaming(const std::string& owner, const Backend::SwitchPolicy& stored,
                      const SwitchRecord& record, const std::vector<std::string>& uplinks) const;
    // The port group a virtual port is connected to, or nothing.
    static const PortGroupRecord* GroupOfPort(const SwitchRecord& record, const std::string& port);
    // The address of a virtual port's client: its veth peer's MAC, or nothing.
    std::optional<std::string> ClientMac(const View& view, const Kernel::BridgeLink& port) const;
    bool HasBonding() const;

    Context& context_;
    std::string sysfs_ = "/sys";
};

}  // namespace TknCtl::Linux

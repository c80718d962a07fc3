// Bringing the Linux host back to a snapshot (core/snapshot.h): what differs between the host
// as it is and the snapshot is planned as steps, each a kernel request or a file written, and
// carried out; what is new goes, what went is made again, what changed is set back.
//
// The work goes in phases, the host read again before each, because each phase needs what the
// ones before it made (an address needs its device, a route its address):
//
//   netstacks      named namespaces made or removed (with /etc/netns/NAME)
//   links          veth pairs and bridges made or removed (other devices are never made or
//                  removed: their differences are said, not mended)
//   link settings  the netstacks' settings, then each link's bridge, MTU, MAC, VLAN filtering,
//                  port flags, VLANs, static forwarding entries, token bucket, IPv6 settings,
//                  and last its administrative state
//   addresses      per device and family, in the kernel's order
//   routes         routes and permanent neighbours
//   the rest       the firewall's table, xfrm policies and states, resolv.conf files, the
//                  host's document
//
// Planning takes plain values only (PlanRestore), so that it is tested without a kernel;
// Restore composes it with the kernel. Restoring is idempotent: on a host that is as the
// snapshot says it plans nothing and changes nothing.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "core/snapshot.h"

namespace TknCtl::Linux {

struct RestoreStep {
    enum class Action {
        kDeleteNetstack,
        kAddNetstack,
        kMakeNetstackFiles,
        kRemoveNetstackFiles,
        kMakeFilesDirectory,  // /etc/netns
        kRemoveFilesDirectory,
        kSetSysctl,
        kDeleteLink,
        kAddBridge,
        kAddVeth,
        kSetMaster,
        kSetMtu,
        kSetMac,
        kSetVlanFiltering,
        kSetPortFlags,
        kAddVlans,
        kDeleteVlans,
        kAddStaticEntry,
        kDeleteStaticEntry,
        kSetBucket,
        kDeleteBucket,
        kSetUp,
        kDeleteAddress,
        kAddAddress,
        kDeleteRoute,
        kAddRoute,
        kDeleteNeighbour,
        kAddNeighbour,
        kSetFirewall,
        kDeleteFirewall,
        kDeletePolicy,
        kAddPolicy,
        kDeleteState,
        kWriteResolvConf,
        kRemoveResolvConf,
        kWriteDocument,
        kRemoveDocument,
        kCannot,  // a difference no request mends (a device gone that the host cannot make)
    };

    Action action = Action::kCannot;
    std::string netstack;           // where; empty for what concerns the host as a whole
    std::string name;               // the link, setting or file
    std::string value;              // a setting's value, a MAC address, a master's name, a file's text
    unsigned number = 0;            // an MTU
    bool on = false;                // up, VLAN filtering
    std::optional<SavedLink> link;  // a link to make; a veth end
    std::optional<SavedLink> peer;  // the other end of a veth
    std::string peerNetstack;
    std::optional<SavedPortFlags> flags;
    std::vector<Kernel::PortVlan> vlans;
    std::optional<Kernel::TokenBucket> bucket;
    std::optional<SavedAddress> address;
    std::optional<SavedRoute> route;
    std::optional<SavedNeighbour> neighbour;
    std::optional<SavedPolicy> policy;
    std::optional<SavedState> state;

    // What the step does, for messages: "add route 10.9.0.0/16 via 10.1.0.2 (netstack glidex)".
    std::string Describe() const;
};

enum class RestorePhase { kNetstacks, kLinks, kLinkSettings, kAddresses, kRoutes, kRest };
constexpr RestorePhase kRestorePhases[] = {RestorePhase::kNetstacks,    RestorePhase::kLinks,
                                           RestorePhase::kLinkSettings, RestorePhase::kAddresses,
                                           RestorePhase::kRoutes,       RestorePhase::kRest};

// The steps of one phase that bring live to wanted, in the order they are to be carried out.
std::vector<RestoreStep> PlanRestore(const Snapshot& live, const Snapshot& wanted, RestorePhase phase);
// What differs, every phase: the descriptions of the steps that would mend it.
std::vector<std::string> Differences(const Snapshot& live, const Snapshot& wanted);

class Context;

// Brings the host back to wanted and reads it back; throws HostCtl::Lib::HostCtlException
// saying what still differs (and the kernel's refusals) when it could not. The caller holds the
// document's lock (Context::BeginChange or Document::Lock).
void Restore(Context& context, const Snapshot& wanted);

}  // namespace TknCtl::Linux

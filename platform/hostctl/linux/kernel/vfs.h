// The virtual functions of an SR-IOV device as rtnetlink reports them with the link of its
// physical function: a RTM_GETLINK with IFLA_EXT_MASK RTEXT_FILTER_VF answers with
// IFLA_NUM_VF and IFLA_VFINFO_LIST, one IFLA_VF_INFO per VF (MAC address, VLANs, spoof check,
// trust, link state, rates and, unless RTEXT_FILTER_SKIP_STATS is asked for, counters). The
// request is built (BuildVfRequest) and the reply read (ParseVfs) as plain values, so that both
// are tested without a kernel.
//
// Which VFs exist, and who uses them, is sysfs's matter (kernel/sysfs.h: ReadSriov).
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "kernel/netlink.h"

struct nl_msg;
struct nlmsghdr;

namespace TknCtl::Linux::Kernel {

// The counters of a VF (IFLA_VF_STATS). The drivers count every frame the VF received in
// rxPackets and rxBytes, multicast and broadcast frames included; multicast and broadcast are
// received frames only.
struct VfCounters {
    std::uint64_t rxPackets = 0, txPackets = 0, rxBytes = 0, txBytes = 0;
    std::uint64_t broadcast = 0, multicast = 0;
    std::uint64_t rxDropped = 0, txDropped = 0;
};

struct VfVlan {
    std::uint32_t id = 0;
    std::uint32_t qos = 0;            // the 802.1p priority
    std::uint16_t protocol = 0x8100;  // ETH_P_8021Q or ETH_P_8021AD
};

// The PF's hold on a VF's link: as the PF's own link (auto), always up, always down.
enum class VfLinkState { kAuto, kEnable, kDisable };

struct VfConfig {
    std::uint32_t number = 0;        // the VF's number (the N of the PF device's virtfnN)
    std::string mac;                 // "02:00:00:00:00:01", lower case; all zeros when none is set
    std::vector<VfVlan> vlans;       // the VLANs the PF tags the VF's traffic with; empty: none
    std::optional<bool> spoofCheck;  // nothing: the driver does not say
    std::optional<bool> trust;
    VfLinkState linkState = VfLinkState::kAuto;
    std::uint32_t minRate = 0, maxRate = 0;  // Mbps; 0: no bound
    std::optional<VfCounters> counters;      // nothing: not asked for, or the driver keeps none
};

// What rtnetlink says of the VFs of a link.
struct LinkVfs {
    int index = 0;
    std::string name;
    // IFLA_NUM_VF: the VFs enabled on the link's device; nothing for a link on no device.
    std::optional<std::uint32_t> numVfs;
    // Whether the driver reports its VFs (IFLA_VFINFO_LIST): a driver without SR-IOV
    // operations reports none, whatever sysfs says.
    bool reported = false;
    std::vector<VfConfig> vfs;  // in the kernel's order (by number)
};

// The request for a link with its VFs (RTM_GETLINK on the link's index); without counters the
// kernel leaves them out (and does not ask the driver for them). The caller frees it with
// nlmsg_free.
nl_msg* BuildVfRequest(int index, bool withCounters);
// A reply (RTM_NEWLINK) reads into plain values; nothing when it is no link message. Entries
// too short for what they claim to hold are left out.
std::optional<LinkVfs> ParseVfs(const nlmsghdr* message);
// Asks the kernel for the link of that index with its VFs; throws HostCtlException naming the
// link when the kernel refuses (what: "NAME").
LinkVfs ReadVfs(const Namespace& ns, int index, bool withCounters, const std::string& name);

}  // namespace TknCtl::Linux::Kernel

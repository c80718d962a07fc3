// The SR-IOV NICs of the Linux host: what the area (network/sriov.cpp) makes of what sysfs and
// rtnetlink say of a virtual function, as functions of plain values.
#pragma once

#include <map>
#include <optional>
#include <string>
#include <vector>

#include "hostctl/network/nic.h"
#include "kernel/processes.h"
#include "kernel/sysfs.h"
#include "kernel/vfs.h"

namespace TknCtl::Linux {

// Whether an interface whose port has that name (phys_port_name) stands for a VF or a
// sub-function of its device ("pf0vf3", "c1pf0sf2": a representor of a switch in switchdev
// mode) rather than for the device itself: its device is the PF's, but it is no PF.
bool IsFunctionRepresentor(const std::string& portName);

// Whether a driver hands the function it is bound to over to user space (VFIO, UIO) or merely
// claims it (pci-stub), rather than driving it in the kernel.
bool IsUserSpaceDriver(const std::string& driver);

// The device files through which a process holds a VF (absolute paths): the VFIO group of its
// IOMMU group while a VFIO driver has it, its VFIO device, its UIO devices.
std::vector<std::string> VfDeviceFiles(const Kernel::VirtualFunction& vf);

// Whether a VF is in use, and by which process.
struct VfUse {
    bool active = false;
    std::string owner;  // the PID of the process that holds it; empty: none
};

// A VF is in use ("active") when:
// - a process holds one of its device files (VfDeviceFiles): it is handed to that process (a
//   virtual machine's emulator, a user-space network application), which owns it;
// - else a driver of the kernel drives it, and one of its interfaces here is up, or none is
//   seen here (its interface lives in another network namespace, or the driver has none).
// A VF with no driver, one a user-space driver has but no process holds, and one whose
// interfaces here are all down are not in use; nor is a VF whose link its PF holds down
// (link state "disable"), whoever holds it.
// linkState: what rtnetlink says (nothing when the driver does not report its VFs); holders:
// FileHolders of the VF's device files; interfacesUp: this namespace's interfaces, up or not.
VfUse DecideVfUse(const Kernel::VirtualFunction& vf, std::optional<Kernel::VfLinkState> linkState,
                  const std::map<std::string, Kernel::Process>& holders,
                  const std::map<std::string, bool>& interfacesUp);

// A VF's counters as the library's record. The kernel counts all received frames and their
// bytes together, received multicast and broadcast frames apart, and sent frames and bytes as
// one sum each: received unicast frames are the received frames less the multicast and
// broadcast ones; the received and sent bytes, and the sent frames, are shown as unicast
// (multicast and broadcast bytes, and sent multicast and broadcast frames, as 0); frames
// dropped on receipt for want of buffers are the kernel's received drops, discarded sent
// frames its sent drops. Error drops, sent errors, LRO and TSO have no VF counter: 0.
HostCtl::Network::SriovNicVFStats VfStatsOf(const Kernel::VfCounters& counters);

}  // namespace TknCtl::Linux

// The command classes of physical NICs and SR-IOV.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "frame/command.h"
#include "hostctl/network/nic.h"
#include "hostctl/network/portset.h"

namespace TalvexCli::NetworkNamespace {

// ---------------------------------------------------------------- list, get, set, up, down

class NicList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicList)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicSet)
};

class NicUp : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicUp)
};

class NicDown : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicDown)
};

// ---------------------------------------------------------------- offloads and tunables

class NicCoalesceGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicCoalesceGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicCoalesceSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicCoalesceSet)
};

class NicCoalesceLowGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicCoalesceLowGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicCoalesceLowSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicCoalesceLowSet)
};

class NicCoalesceHighGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicCoalesceHighGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicCoalesceHighSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicCoalesceHighSet)
};

class NicCsoGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicCsoGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicCsoSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicCsoSet)
};

class NicTsoGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicTsoGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicTsoSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicTsoSet)
};

class NicSgGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicSgGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicSgSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicSgSet)
};

class NicPauseParamsList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicPauseParamsList)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicPauseParamsSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicPauseParamsSet)
};

class NicRingPresetGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicRingPresetGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicRingCurrentGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicRingCurrentGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicRingCurrentSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicRingCurrentSet)
};

class NicSoftwareList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicSoftwareList)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicSoftwareSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicSoftwareSet)
};

// ---------------------------------------------------------------- statistics and diagnostics

class NicStatsGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicStatsGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicVlanStatsGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicVlanStatsGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicVlanStatsSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicVlanStatsSet)
};

class NicRegisterDump : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicRegisterDump)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicEepromDump : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicEepromDump)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicEepromChange : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicEepromChange)
};

class NicSelfTestRun : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicSelfTestRun)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicNegotiationRestart : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicNegotiationRestart)
};

// ---------------------------------------------------------------- netqueue

class NicQueueLbSettingList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicQueueLbSettingList)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicQueueLbSettingSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicQueueLbSettingSet)
};

class NicQueueLbStateList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicQueueLbStateList)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicQueueLbStateSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicQueueLbStateSet)
};

class NicQueueLbPluginList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicQueueLbPluginList)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicQueueLbPluginSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicQueueLbPluginSet)
};

class NicQueueCountGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicQueueCountGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class NicQueueCountSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicQueueCountSet)
};

class NicQueueFilterClassList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(NicQueueFilterClassList)
public:
    RecordPtr GetOutputStructure();
};

// ---------------------------------------------------------------- SR-IOV

class SriovNicList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(SriovNicList)
public:
    virtual RecordPtr GetOutputStructure();
};

class VfList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VfList)
public:
    virtual RecordPtr GetOutputStructure();
};

class VfStats : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VfStats)
public:
    virtual RecordPtr GetOutputStructure();
};

// ---------------------------------------------------------------- shared by the NIC commands

namespace Nic {

// "Up" or "Down".
const char* UpDown(bool up);
// "on" or "off".
const char* OnOff(bool on);
// "Full" for duplex code 1, "Half" for every other code.
const char* DuplexText(std::uint32_t duplex);

// The value of an integer parameter that the host keeps as an unsigned 32-bit number; a
// value outside 0 to 4294967295 is refused (Frame::Fail) rather than cut to 32 bits.
std::uint32_t Uint32Parameter(const Zorbel::CallSpec::Input& input, const std::string& name);

// The first switch whose uplinks include the NIC (exact name), or nothing.
std::unique_ptr<HostCtl::Network::Portset> SwitchOfUplink(
    std::vector<std::unique_ptr<HostCtl::Network::Portset>> switches, const std::string& nic);

// Appends the hex dump lines of bytes that start at offset start: one record per 16-byte
// aligned block, "Offset" in at least four lowercase hexadecimal digits, "Value" each byte as
// two digits and a blank, with three blanks for each position of the first block before start.
// makeRecord gives a fresh record with the fields "Offset" and "Value".
void AddHexDumpLines(Zorbel::MetaObj::MetaList& list, const std::function<RecordPtr()>& makeRecord,
                     std::uint64_t start, const std::vector<std::uint8_t>& bytes);

// Visits the netqueue record of the named adapter (name not null) or of every adapter. A named
// adapter that does not exist fails with notFound; one whose record cannot be read fails with
// the library's message. Unnamed, an adapter whose record cannot be read is skipped.
void ForEachNetqueue(
    const std::string* name, const std::string& notFound,
    const std::function<void(HostCtl::Network::Pnic&, const HostCtl::Network::PnicNetqueueInfo&)>& visit);

}  // namespace Nic

}  // namespace TalvexCli::NetworkNamespace

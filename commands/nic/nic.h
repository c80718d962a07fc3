// The command classes of physical NICs and SR-IOV.
#pragma once

#include <cstdint>
#include <string>

#include "frame/command.h"

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

}  // namespace Nic

}  // namespace TalvexCli::NetworkNamespace

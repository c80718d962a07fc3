// The command classes of distributed switches, LACP, ports and VMs.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "frame/command.h"
#include "hostctl/network/dvs.h"

namespace TalvexCli::NetworkNamespace {

// "network vswitch dvs talvex list"
class VirtualSwitchDVSTalvexList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchDVSTalvexList)
public:
    virtual RecordPtr GetOutputStructure();
    // An empty DVPort record.
    RecordPtr GetDVPortStructure();
    // One filled DVPort record per distributed port, in the switch's order.
    ListPtr GetDVPortList(const std::vector<std::unique_ptr<HostCtl::Network::DVPort>>& ports);
};

// "network vswitch dvs talvex lacp config get"
class LacpGetConfig : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(LacpGetConfig)
public:
    virtual RecordPtr GetOutputStructure();
};

// "network vswitch dvs talvex lacp status get"
class LacpGetStatus : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(LacpGetStatus)
public:
    virtual RecordPtr GetOutputStructure();
    virtual RecordPtr GetLACPNicInfoStruct();
    virtual RecordPtr GetLACPLocalInfoStruct();
    virtual RecordPtr GetLACPPartnerInfoStruct();
};

// "network vswitch dvs talvex lacp stats get"
class LacpGetStats : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(LacpGetStats)
public:
    virtual RecordPtr GetOutputStructure();
};

// "network vswitch dvs talvex lacp timeout set"
class LacpSetTimeout : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(LacpSetTimeout)
};

// "network port stats get"
class PortStatsGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(PortStatsGet)
public:
    virtual RecordPtr GetOutputStructure();
};

// "network port filter stats get"
class PortFilterStatsGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(PortFilterStatsGet)
public:
    virtual RecordPtr GetOutputStructure();
};

// The order filter statistics are listed in: receive-side filters (direction flag false) by
// name ascending, then send-side filters by name descending; names compare byte-wise.
bool sortFilterStats(const std::unique_ptr<HostCtl::Network::FilterStats>& a,
                     const std::unique_ptr<HostCtl::Network::FilterStats>& b);

// "network vm list"
class VMList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VMList)
public:
    virtual RecordPtr GetOutputStructure();
};

// "network vm port list"
class VMPortList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VMPortList)
public:
    virtual RecordPtr GetOutputStructure();
};

// ---------------------------------------------------------------- shared by the commands above

namespace Dvs {

// A decimal integer as the command line gives it (optional sign); nothing when it is not one
// or does not fit in 64 bits.
std::optional<std::int64_t> ParseDecimal(const std::string& text);

// The distributed switches an LACP command works on: the one named by "dvs" when given, else
// every distributed switch. A name the host does not know is refused (HostCtlException).
std::vector<std::unique_ptr<HostCtl::Network::DVSwitch>> SelectLacpSwitches(
    const Zorbel::CallSpec::Input& input);

// The message for a distributed switch name the host does not know.
std::string UnknownSwitchMessage(const std::string& name);

// The port of the host with that ID, of any switch; nothing when there is none. Ports the
// library does not hand out as its own port objects are passed over.
std::unique_ptr<HostCtl::Network::Port> FindPort(std::int64_t portId);

}  // namespace Dvs

}  // namespace TalvexCli::NetworkNamespace

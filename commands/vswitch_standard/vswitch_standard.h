// The command classes of standard virtual switches, uplinks, port groups and their policies,
// and the policy parameters and appliers the policy commands share.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "frame/command.h"
#include "hostctl/network/vswitch.h"

namespace TalvexCli::NetworkNamespace {

// ---------------------------------------------------------------- switches and uplinks

class VirtualSwitchStandardAdd : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchStandardAdd)
};

class VirtualSwitchStandardList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchStandardList)
public:
    virtual RecordPtr GetOutputStructure();
};

class VirtualSwitchStandardRemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchStandardRemove)
};

class VirtualSwitchStandardSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchStandardSet)
};

class VirtualSwitchStandardUplinkAdd : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchStandardUplinkAdd)
};

class VirtualSwitchStandardUplinkRemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchStandardUplinkRemove)
};

// ---------------------------------------------------------------- switch policies

class VirtualSwitchStandardPolicyFailoverGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchStandardPolicyFailoverGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class VirtualSwitchStandardPolicyFailoverSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchStandardPolicyFailoverSet)
};

class VirtualSwitchStandardPolicySecurityGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchStandardPolicySecurityGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class VirtualSwitchStandardPolicySecuritySet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchStandardPolicySecuritySet)
};

class VirtualSwitchStandardPolicyShapingGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchStandardPolicyShapingGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class VirtualSwitchStandardPolicyShapingSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchStandardPolicyShapingSet)
};

// ---------------------------------------------------------------- port-group policies

class VirtualSwitchPortGroupPolicyFailoverGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchPortGroupPolicyFailoverGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class VirtualSwitchPortGroupPolicyFailoverSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchPortGroupPolicyFailoverSet)
};

class VirtualSwitchPortGroupPolicySecurityGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchPortGroupPolicySecurityGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class VirtualSwitchPortGroupPolicySecuritySet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchPortGroupPolicySecuritySet)
};

class VirtualSwitchPortGroupPolicyShapingGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchPortGroupPolicyShapingGet)
public:
    virtual RecordPtr GetOutputStructure();
};

class VirtualSwitchPortGroupPolicyShapingSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchPortGroupPolicyShapingSet)
};

// ---------------------------------------------------------------- port groups

class VirtualSwitchPortGroupList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchPortGroupList)
public:
    virtual RecordPtr GetOutputStructure();
};

class VirtualSwitchPortGroupAdd : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchPortGroupAdd)
};

class VirtualSwitchPortGroupRemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchPortGroupRemove)
};

class VirtualSwitchPortGroupSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(VirtualSwitchPortGroupSet)
};

// ---------------------------------------------------------------- shared policy parameters

// Declare the optional parameters of one policy on a command's InputSpec.
void AddFailoverParameters(const InputSpecPtr& spec);
void AddSecurityParameters(const InputSpecPtr& spec);
void AddShapingParameters(const InputSpecPtr& spec);

// Apply the policy parameters present in input to the policy being edited. Every problem adds
// an error message to output and the applier goes on, so that all of them are reported; the
// caller writes the policy back only when output has no error.
//
// Failover: reference is the policy in force (where the old active and standby lists come
// from when only one of the two lists is given); switchUplinks the uplinks of the switch.
void SetFailoverPolicy(const InputPtr& input, const OutputPtr& output,
                       HostCtl::Network::NicTeamingPolicy& edited,
                       HostCtl::Network::NicTeamingPolicy& reference,
                       std::vector<std::string>& switchUplinks);
void SetSecurityPolicy(const InputPtr& input, const OutputPtr& output,
                       HostCtl::Network::PortSecurityPolicy& policy);
// requireAll demands the three values whenever the policy is enabled, not only when
// "enabled" is given as true.
void SetShapingPolicy(const InputPtr& input, const OutputPtr& output, HostCtl::Network::ShapingPolicy& policy,
                      bool requireAll);

// The names of a comma-separated uplink list, in order.
std::vector<std::string> SplitUplinks(const std::string& text);

// ---------------------------------------------------------------- shared by the commands

namespace VswitchStandard {

// The standard switch of that name, or nothing when the host has no such switch.
std::unique_ptr<HostCtl::Network::VirtualSwitch> FindLegacySwitch(const std::string& name);
// The standard switch of that name; a HostCtlException when there is none.
std::unique_ptr<HostCtl::Network::VirtualSwitch> SwitchById(const std::string& name);

// The records of the policy get commands: the fields a switch and a port group share, then
// the port group's override marks.
RecordPtr FailoverRecord(const char* recordName, bool portGroup);
RecordPtr SecurityRecord(const char* recordName, bool portGroup);
RecordPtr ShapingRecord(const char* recordName, bool portGroup);
void FillFailover(Zorbel::MetaObj::MetaStruct& record, const HostCtl::Network::NicTeamingPolicy& policy,
                  const std::vector<std::string>& switchUplinks);
void FillFailoverOverrides(Zorbel::MetaObj::MetaStruct& record,
                           const HostCtl::Network::NicTeamingPolicy& own);
void FillSecurity(Zorbel::MetaObj::MetaStruct& record, const HostCtl::Network::PortSecurityPolicy& policy);
void FillSecurityOverrides(Zorbel::MetaObj::MetaStruct& record,
                           const HostCtl::Network::PortSecurityPolicy& own);
void FillShaping(Zorbel::MetaObj::MetaStruct& record, const HostCtl::Network::ShapingPolicy& policy);
void FillShapingOverrides(Zorbel::MetaObj::MetaStruct& record, const HostCtl::Network::ShapingPolicy& own);

// What the policy get commands tell the framework: formatter, heading and fields (and the
// shaping units) of their record.
Frame::Description GetDescription(const char* description, const char* recordName, bool shaping,
                                  bool portGroup);

// The "use-vswitch" flag of the port-group set commands; the security set command's text has
// three blanks after its first sentence.
Frame::Param UseVswitchParameter(bool securityText);

}  // namespace VswitchStandard

}  // namespace TalvexCli::NetworkNamespace

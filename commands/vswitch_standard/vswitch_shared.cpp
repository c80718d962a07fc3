// What the switch, uplink, port-group and policy commands share: switch lookups and the
// records of the policy get commands.
#include <algorithm>

#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace::VswitchStandard {

using namespace HostCtl::Network;

std::unique_ptr<VirtualSwitch> FindLegacySwitch(const std::string& name) {
    if (!TknCtl::Network::PortsetImpl::IsValidVirtualSwitch(name)) return nullptr;
    TknCtl::Network::VirtualSwitchInfoImpl info;
    return info.GetVirtualSwitchByName(name);
}

std::unique_ptr<VirtualSwitch> SwitchById(const std::string& name) {
    auto vswitch = NetworkFactory::GetVirtualSwitchById(name);
    // The factory refuses an unknown switch itself; never go on without one.
    if (!vswitch) Frame::Fail("Unable to find virtual switch with the name " + name);
    return vswitch;
}

// ---------------------------------------------------------------- records

namespace {

const char* const kFailoverFields =
    "Load Balancing,Network Failure Detection,Notify Switches,Failback,"
    "Active Adapters,Standby Adapters,Unused Adapters";
const char* const kFailoverOverrideFields =
    ",Override Vswitch Load Balancing,Override Vswitch Network Failure Detection,"
    "Override Vswitch Notify Switches,Override Vswitch Failback,Override Vswitch Uplinks";
const char* const kSecurityFields = "Allow Promiscuous,Allow MAC Address Change,Allow Forged Transmits";
const char* const kSecurityOverrideFields =
    ",Override Vswitch Allow Promiscuous,Override Vswitch Allow MAC Address Change,"
    "Override Vswitch Allow Forged Transmits";
const char* const kShapingFields = "Enabled,Average Bandwidth,Peak Bandwidth,Burst Size";
const char* const kShapingOverrideFields =
    ",Override Vswitch Enabled,Override Vswitch Average Bandwidth,"
    "Override Vswitch Peak Bandwidth,Override Vswitch Burst Size";

// The fields of a comma-separated list, as record fields made by make.
std::vector<Frame::Field> Fields(std::string list, Frame::Field (*make)(std::string)) {
    std::vector<Frame::Field> fields;
    std::size_t start = 0;
    while (start <= list.size()) {
        auto comma = list.find(',', start);
        if (comma == std::string::npos) comma = list.size();
        if (comma > start) fields.push_back(make(list.substr(start, comma - start)));
        start = comma + 1;
    }
    return fields;
}

RecordPtr Record(const char* recordName, std::vector<Frame::Field> fields, const char* overrides) {
    if (overrides) {
        auto more = Fields(overrides, Frame::BoolField);
        fields.insert(fields.end(), more.begin(), more.end());
    }
    return Frame::MakeRecord(recordName, fields);
}

const char* LoadBalancingName(int type) {
    switch (type) {
        case NicTeamingPolicy::TEAM_IPHASH:
            return "iphash";
        case NicTeamingPolicy::TEAM_SRCMAC:
            return "srcmac";
        case NicTeamingPolicy::TEAM_PORTID:
            return "srcport";
        case NicTeamingPolicy::TEAM_EXPLICIT:
            return "explicit";
        default:
            return "unknown";
    }
}

}  // namespace

RecordPtr FailoverRecord(const char* recordName, bool portGroup) {
    return Record(recordName,
                  {Frame::StringField("Load Balancing"), Frame::StringField("Network Failure Detection"),
                   Frame::BoolField("Notify Switches"), Frame::BoolField("Failback"),
                   Frame::StringListField("Active Adapters"), Frame::StringListField("Standby Adapters"),
                   Frame::StringListField("Unused Adapters")},
                  portGroup ? kFailoverOverrideFields : nullptr);
}

RecordPtr SecurityRecord(const char* recordName, bool portGroup) {
    return Record(recordName, Fields(kSecurityFields, Frame::BoolField),
                  portGroup ? kSecurityOverrideFields : nullptr);
}

RecordPtr ShapingRecord(const char* recordName, bool portGroup) {
    return Record(recordName,
                  {Frame::BoolField("Enabled"), Frame::IntField("Average Bandwidth"),
                   Frame::IntField("Peak Bandwidth"), Frame::IntField("Burst Size")},
                  portGroup ? kShapingOverrideFields : nullptr);
}

void FillFailover(Zorbel::MetaObj::MetaStruct& record, const NicTeamingPolicy& policy,
                  const std::vector<std::string>& switchUplinks) {
    const auto& criteria = policy.GetLinkCriteria();
    const bool beacon = criteria.IsBeaconSet() && !criteria.GetBeacon();
    const auto& order = policy.GetUplinkOrder();
    const auto active = static_cast<std::size_t>(
        std::clamp<long>(policy.GetMaxActiveUplinks(), 0, static_cast<long>(order.size())));
    std::vector<std::string> unused;
    for (const auto& uplink : switchUplinks) {
        if (std::find(order.begin(), order.end(), uplink) == order.end()) unused.push_back(uplink);
    }
    record.SetField("Load Balancing", LoadBalancingName(policy.GetTeamingPolicy()));
    record.SetField("Network Failure Detection", beacon ? "beacon" : "link");
    record.SetField("Notify Switches", policy.GetNotifySwitchOnFailure());
    record.SetField("Failback", !policy.GetRollingRestoration());
    record.SetField("Active Adapters", std::vector<std::string>(order.begin(), order.begin() + active));
    record.SetField("Standby Adapters", std::vector<std::string>(order.begin() + active, order.end()));
    record.SetField("Unused Adapters", unused);
}

void FillFailoverOverrides(Zorbel::MetaObj::MetaStruct& record, const NicTeamingPolicy& own) {
    record.SetField("Override Vswitch Load Balancing", own.IsTeamingPolicySet());
    record.SetField("Override Vswitch Network Failure Detection", own.IsLinkCriteriaSet());
    record.SetField("Override Vswitch Notify Switches", own.IsNotifySwitchOnFailureSet());
    record.SetField("Override Vswitch Failback", own.IsRollingRestorationSet());
    record.SetField("Override Vswitch Uplinks", own.IsUplinkOrderSet() || own.IsMaxActiveUplinksSet());
}

void FillSecurity(Zorbel::MetaObj::MetaStruct& record, const PortSecurityPolicy& policy) {
    record.SetField("Allow Promiscuous", policy.GetAllowPromiscuous());
    record.SetField("Allow MAC Address Change", policy.GetAllowMacAddressChange());
    record.SetField("Allow Forged Transmits", policy.GetAllowForgedTransmits());
}

void FillSecurityOverrides(Zorbel::MetaObj::MetaStruct& record, const PortSecurityPolicy& own) {
    record.SetField("Override Vswitch Allow Promiscuous", own.IsAllowPromiscuousSet());
    record.SetField("Override Vswitch Allow MAC Address Change", own.IsAllowMacAddressChangeSet());
    record.SetField("Override Vswitch Allow Forged Transmits", own.IsAllowForgedTransmitsSet());
}

void FillShaping(Zorbel::MetaObj::MetaStruct& record, const ShapingPolicy& policy) {
    const bool enabled = policy.IsEnabled();
    record.SetField("Enabled", enabled);
    record.SetField("Average Bandwidth", enabled ? static_cast<long>(policy.GetAverageBps() / 1000) : -1L);
    record.SetField("Peak Bandwidth", enabled ? static_cast<long>(policy.GetPeakBps() / 1000) : -1L);
    record.SetField("Burst Size", enabled ? static_cast<long>(policy.GetBurstSize() / 128) : -1L);
}

void FillShapingOverrides(Zorbel::MetaObj::MetaStruct& record, const ShapingPolicy& own) {
    record.SetField("Override Vswitch Enabled", own.IsEnabledSet());
    record.SetField("Override Vswitch Average Bandwidth", own.IsAverageBpsSet());
    record.SetField("Override Vswitch Peak Bandwidth", own.IsPeakBpsSet());
    record.SetField("Override Vswitch Burst Size", own.IsBurstSizeSet());
}

Frame::Description GetDescription(const char* description, const char* recordName, bool shaping,
                                  bool portGroup) {
    const std::string record = recordName;
    std::string fields;
    if (record.find("Failover") != std::string::npos) {
        fields = std::string(kFailoverFields) + (portGroup ? kFailoverOverrideFields : "");
    } else if (shaping) {
        fields = std::string(kShapingFields) + (portGroup ? kShapingOverrideFields : "");
    } else {
        fields = std::string(kSecurityFields) + (portGroup ? kSecurityOverrideFields : "");
    }
    Frame::Description out{
        description, "fetcher", "simple", {{"header:" + record, "<NONE>"}, {"fields:" + record, fields}}};
    if (shaping) {
        out.outputParameters.push_back({"units:" + record + ".Average Bandwidth", "Kbps"});
        out.outputParameters.push_back({"units:" + record + ".Peak Bandwidth", "Kbps"});
        out.outputParameters.push_back({"units:" + record + ".Burst Size", "Kib"});
    }
    return out;
}

Frame::Param UseVswitchParameter(bool securityText) {
    const std::string gap = securityText ? "   " : " ";
    const std::string first =
        "Reset all values for this policy to use parent virtual switch's settings instead of overriding the "
        "settings for the port group.";
    const std::string second =
        "Using this in conjunction with other settings will first reset all of the fields to use the virtual "
        "switch setting and then apply the other options after the reset.";
    return {"use-vswitch", "u", Frame::kFlag, first + gap + second};
}

}  // namespace TalvexCli::NetworkNamespace::VswitchStandard

// Shared pieces of the standard-switch operations: policy values between the model and the
// public types, effective policies, and the checks a policy update must pass.
#pragma once

#include <string>

#include "hostctl/network/vswitch.h"
#include "model/vswitches.h"

namespace TknCtl::Backend {
class Switches;
}

namespace TknCtl::Network::VSwitchModel {

HostCtl::Network::NicTeamingPolicy ToPublic(const Model::TeamingPolicy& policy);
HostCtl::Network::PortSecurityPolicy ToPublic(const Model::SecurityPolicy& policy);
HostCtl::Network::ShapingPolicy ToPublic(const Model::ShapingPolicy& policy);
HostCtl::Network::NicCapabilities ToPublic(const Model::Capabilities& capabilities);
Model::TeamingPolicy ToModel(const HostCtl::Network::NicTeamingPolicy& policy);
Model::SecurityPolicy ToModel(const HostCtl::Network::PortSecurityPolicy& policy);
Model::ShapingPolicy ToModel(const HostCtl::Network::ShapingPolicy& policy);
Model::Capabilities ToModel(const HostCtl::Network::NicCapabilities& capabilities);

// The host's defaults for a new switch.
Model::Policy DefaultPolicy();
Model::Capabilities DefaultCapabilities();

// The teaming policy in force on a switch: with no stored uplink order every uplink is
// active in the switch's order; with no stored active count every uplink of the order is active.
Model::TeamingPolicy EffectiveTeaming(const Model::VSwitch& vswitch);
// A port group's policies in force: its overrides over its switch's.
Model::TeamingPolicy EffectiveTeaming(const Model::VSwitch& vswitch, const Model::PortGroup& group);
Model::SecurityPolicy EffectiveSecurity(const Model::VSwitch& vswitch, const Model::PortGroup& group);
Model::ShapingPolicy EffectiveShaping(const Model::VSwitch& vswitch, const Model::PortGroup& group);

// Refuses a teaming policy (its set fields) that the switch cannot take: an unknown teaming
// type, an uplink order naming a NIC that is not an uplink of the switch or naming one twice,
// a negative number of active uplinks. owner names the switch or port group in the message.
void CheckTeaming(const Model::TeamingPolicy& policy, const Model::VSwitch& vswitch,
                  const std::string& owner);

// Takes uplink out of a teaming order; an active entry leaves one active place with it.
void DropFromOrder(Model::TeamingPolicy& policy, const std::string& uplink);

// The switch of that name; throws HostCtlException when there is none.
const Model::VSwitch& FindSwitch(const std::string& name);

// The switch area of the real host the session manages; nullptr on the simulated host.
Backend::Switches* RealSwitches();
// A switch of the real host in the model's shape (its uplinks, its stored policy, its port
// groups' overrides), so that the policy rules above serve both hosts.
Model::VSwitch RealSwitchModel(Backend::Switches& switches, const std::string& name);

}  // namespace TknCtl::Network::VSwitchModel

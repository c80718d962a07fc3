// The policy parameters the switch and port-group policy commands share, and their appliers.
#include <algorithm>
#include <cstdint>
#include <limits>

#include <boost/regex.hpp>

#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::NicTeamingPolicy;

// ---------------------------------------------------------------- parameters

void AddFailoverParameters(const InputSpecPtr& spec) {
    const std::vector<Frame::Param> params = {
        {"load-balancing", "l", Frame::kString,
         "Set the load balancing policy for this policy. This can be one of the following options: "
         "%FULLENUM%",
         Frame::kOptional,
         Frame::StringEnum(
             {{"portid", "Route based on the originating virtual port ID."},
              {"iphash", "Route based on hashing the src and destination IP addresses"},
              {"mac", "Route based on the MAC address of the packet source."},
              {"explicit",
               "Always use the highest order uplink from the list of active adapters which pass "
               "failover criteria."}})},
        {"failure-detection", "f", Frame::kString,
         "Set the method of determining how a network outage is detected. %FULLENUM%", Frame::kOptional,
         Frame::StringEnum({{"link", "Detect failures based on the NIC link state"},
                            {"beacon", "Detect failures based on active beaconing to the vswitch"}})},
        {"notify-switches", "n", Frame::kBool,
         "Indicate whether to send a notification to physical switches on failover"},
        {"failback", "b", Frame::kBool,
         "Configure whether a NIC will be used immediately when it comes back in service after a failover"},
        {"active-uplinks", "a", Frame::kString,
         "Configure the list of active adapters and their failover order. This list must be a comma "
         "seperated list of values with the uplink name and no spaces. Example:  "
         "--active-uplinks=vmnic0,vmnic3,vmnic7,vmnic1"},
        {"standby-uplinks", "s", Frame::kString,
         "Configure the list of standby adapters and their failover order. This list must be a comma "
         "seperated list of values with the uplink name and no spaces. Example:  "
         "--standby-uplinks=vmnic2,vmnic4,vmnic8,vmnic6,vmnic11"},
    };
    for (const auto& param : params)
        spec->AddParameter(Frame::MakeParameter(param));
}

void AddSecurityParameters(const InputSpecPtr& spec) {
    const std::vector<Frame::Param> params = {
        {"allow-promiscuous", "o", Frame::kBool,
         "Allow ports on the virtual switch to enter promiscuous mode."},
        {"allow-mac-change", "m", Frame::kBool,
         "Allow ports on the virtual switch to change their MAC address."},
        {"allow-forged-transmits", "f", Frame::kBool,
         "Allow ports on the virtual switch to send packets with forged source information."},
    };
    for (const auto& param : params)
        spec->AddParameter(Frame::MakeParameter(param));
}

void AddShapingParameters(const InputSpecPtr& spec) {
    // One range serves the three values.
    const Frame::Constraint positive = Frame::Range(1, std::numeric_limits<long>::max());
    const std::vector<Frame::Param> params = {
        {"enabled", "e", Frame::kBool,
         "Indicate whether to enable traffic shaping on this policy. If this is true then the "
         "--avg-bandwidth, --peak-bandwidth and --burst-size options are required."},
        {"avg-bandwidth", "b", Frame::kInt,
         "The averge bandwidth allowed for this shaping policy. This value is in Kbps (1 Kbps = 1000 bits/s)",
         Frame::kOptional, positive},
        {"peak-bandwidth", "k", Frame::kInt,
         "The peak bandwidth allowed for this shaping policy. This value is in Kbps (1 Kbps = 1000 bits/s)",
         Frame::kOptional, positive},
        {"burst-size", "t", Frame::kInt,
         "The largest burst size allowed for this shaping policy. This value is in Kib (1 Kib = 1024 bits)",
         Frame::kOptional, positive},
    };
    for (const auto& param : params)
        spec->AddParameter(Frame::MakeParameter(param));
}

// ---------------------------------------------------------------- appliers

std::vector<std::string> SplitUplinks(const std::string& text) {
    static const boost::regex comma(",");
    std::vector<std::string> names;
    boost::sregex_token_iterator piece(text.begin(), text.end(), comma, -1);
    for (boost::sregex_token_iterator end; piece != end; ++piece)
        names.push_back(piece->str());
    return names;
}

void SetSecurityPolicy(const InputPtr& input, const OutputPtr&,
                       HostCtl::Network::PortSecurityPolicy& policy) {
    if (input->HasParameter("allow-promiscuous"))
        policy.SetAllowPromiscuous(input->GetParameterBool("allow-promiscuous"));
    if (input->HasParameter("allow-mac-change"))
        policy.SetAllowMacAddressChange(input->GetParameterBool("allow-mac-change"));
    if (input->HasParameter("allow-forged-transmits"))
        policy.SetAllowForgedTransmits(input->GetParameterBool("allow-forged-transmits"));
}

namespace {

// A value of the command line in the library's unit; nothing (and an error) when the product
// does not fit the library's 64 bits.
bool Scaled(const InputPtr& input, const OutputPtr& output, const char* name, std::uint64_t factor,
            std::uint64_t& out) {
    const auto value = static_cast<std::uint64_t>(input->GetParameterInt(name));
    const std::uint64_t limit = std::numeric_limits<std::uint64_t>::max() / factor;
    if (value > limit) {
        output->AddErrorMessage(std::string("The value of --") + name + " is too large (at most " +
                                std::to_string(limit) + ")");
        return false;
    }
    out = value * factor;
    return true;
}

}  // namespace

void SetShapingPolicy(const InputPtr& input, const OutputPtr& output, HostCtl::Network::ShapingPolicy& policy,
                      bool requireAll) {
    bool enabledGiven = false;
    if (input->HasParameter("enabled")) {
        enabledGiven = input->GetParameterBool("enabled");
        policy.SetEnabled(enabledGiven);
    }
    if (!policy.IsEnabled()) return;  // the values matter only to an enabled policy
    const bool demand = enabledGiven || requireAll;
    std::uint64_t value = 0;

    if (input->HasParameter("avg-bandwidth")) {
        if (Scaled(input, output, "avg-bandwidth", 1000, value)) policy.SetAverageBps(value);
    } else if (demand) {
        output->AddErrorMessage("Missing required parameter --avg-bandwidth");
    }
    if (input->HasParameter("peak-bandwidth")) {
        if (Scaled(input, output, "peak-bandwidth", 1000, value)) policy.SetPeakBps(value);
    } else if (demand) {
        output->AddErrorMessage("Missing required parameter --peak-bandwidth");
    }
    if (input->HasParameter("burst-size")) {
        if (Scaled(input, output, "burst-size", 128, value)) policy.SetBurstSize(value);
    } else if (demand) {
        output->AddErrorMessage("Missing required parameter --burst-size");
    }
}

namespace {

bool Contains(const std::vector<std::string>& names, const std::string& name) {
    return std::find(names.begin(), names.end(), name) != names.end();
}

// The names of a list that are physical NICs on the switch, in order; every other name adds
// its error.
std::vector<std::string> CheckedUplinks(const std::string& text, const char* unknownMessage,
                                        const std::vector<std::string>& switchUplinks,
                                        const OutputPtr& output) {
    std::vector<std::string> accepted;
    for (const auto& name : SplitUplinks(text)) {
        if (!TknCtl::Network::PnicImpl::IsValidPnic(name)) {
            output->AddErrorMessage(unknownMessage + name);
        } else if (!Contains(switchUplinks, name)) {
            output->AddErrorMessage("NIC is not connected to the vswitch : " + name);
        } else {
            accepted.push_back(name);
        }
    }
    return accepted;
}

// The number of active entries of a policy's order.
std::size_t ActiveCount(const NicTeamingPolicy& policy) {
    return static_cast<std::size_t>(
        std::clamp<long>(policy.GetMaxActiveUplinks(), 0, static_cast<long>(policy.GetUplinkOrder().size())));
}

}  // namespace

void SetFailoverPolicy(const InputPtr& input, const OutputPtr& output, NicTeamingPolicy& edited,
                       NicTeamingPolicy& reference, std::vector<std::string>& switchUplinks) {
    if (input->HasParameter("load-balancing")) {
        const std::string& text = input->GetParameter("load-balancing");
        if (text == "portid") {
            edited.SetTeamingPolicy(NicTeamingPolicy::TEAM_PORTID);
        } else if (text == "iphash") {
            edited.SetTeamingPolicy(NicTeamingPolicy::TEAM_IPHASH);
        } else if (text == "mac") {
            edited.SetTeamingPolicy(NicTeamingPolicy::TEAM_SRCMAC);
        } else if (text == "explicit") {
            edited.SetTeamingPolicy(NicTeamingPolicy::TEAM_EXPLICIT);
        } else {
            output->AddErrorMessage("Unknown Load Balancing policy: " + text);
        }
    }
    if (input->HasParameter("failure-detection")) {
        const std::string& text = input->GetParameter("failure-detection");
        HostCtl::Network::LinkCriteriaSelectionPolicy criteria;
        if (text == "link") {
            criteria.SetBeacon(true);
            edited.SetLinkCriteria(criteria);
        } else if (text == "beacon") {
            criteria.SetBeacon(false);
            edited.SetLinkCriteria(criteria);
        } else {
            output->AddErrorMessage("Unknown failure detection type " + text);
        }
    }
    if (input->HasParameter("notify-switches"))
        edited.SetNotifySwitchOnFailure(input->GetParameterBool("notify-switches"));
    if (input->HasParameter("failback")) edited.SetRollingRestoration(!input->GetParameterBool("failback"));

    const bool activeGiven = input->HasParameter("active-uplinks");
    const bool standbyGiven = input->HasParameter("standby-uplinks");
    std::vector<std::string> order;
    if (activeGiven) {
        order = CheckedUplinks(input->GetParameter("active-uplinks"),
                               "Unknown NIC name in active uplinks : ", switchUplinks, output);
        const auto active = static_cast<int>(order.size());
        if (!standbyGiven) {
            // The old standby list stays, less the uplinks that are now active.
            const auto& old = reference.GetUplinkOrder();
            for (std::size_t i = ActiveCount(reference); i < old.size(); ++i) {
                if (!Contains(order, old[i])) order.push_back(old[i]);
            }
        }
        edited.SetMaxActiveUplinks(active);
    }
    if (standbyGiven) {
        auto standby = CheckedUplinks(input->GetParameter("standby-uplinks"),
                                      "Unknown NIC name in standby uplinks : ", switchUplinks, output);
        if (!activeGiven) {
            // The old active list stays, less the uplinks that are now standby.
            const auto& old = reference.GetUplinkOrder();
            const std::size_t active = ActiveCount(reference);
            for (std::size_t i = 0; i < active; ++i) {
                if (!Contains(standby, old[i])) order.push_back(old[i]);
            }
            edited.SetMaxActiveUplinks(static_cast<int>(order.size()));
        }
        order.insert(order.end(), standby.begin(), standby.end());
    }
    if (activeGiven || standbyGiven) {
        auto sorted = order;
        std::sort(sorted.begin(), sorted.end());
        if (std::adjacent_find(sorted.begin(), sorted.end()) != sorted.end()) {
            output->AddErrorMessage("some NICs appear in the input for more than once.");
            return;
        }
        edited.SetUplinkOrder(order);
    }
}

}  // namespace TalvexCli::NetworkNamespace

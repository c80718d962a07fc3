#include "commands/firewall/firewall.h"

namespace TalvexCli::NetworkNamespace {

FirewallRulesetAllowedipList::FirewallRulesetAllowedipList() {
    Frame::Describe(*this, {"list allowed ip addresses for rulesets.",
                            "fetcher",
                            "table",
                            {{"fields:FirewallRulesetAllowedip", "Ruleset,Allowed IP Addresses"}}});
}

InputSpecPtr FirewallRulesetAllowedipList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"ruleset-id", "r", Frame::kString, "The label of the ruleset."},
    });
}

OutputSpecPtr FirewallRulesetAllowedipList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr FirewallRulesetAllowedipList::GetOutputStructure() {
    return Frame::MakeRecord("FirewallRulesetAllowedip",
                             {Frame::StringField("Ruleset"), Frame::StringListField("Allowed IP Addresses")});
}

void FirewallRulesetAllowedipList::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::System::SystemInfoImpl system;
        auto list = Frame::MakeList(GetOutputStructure());
        std::vector<std::unique_ptr<HostCtl::System::FirewallRuleset>> selection;
        if (!Firewall::SelectRulesets(*input, output, system, selection)) return;
        for (const auto& ruleset : selection) {
            auto record = GetOutputStructure();
            record->SetField("Ruleset", ruleset->GetName());
            std::vector<std::string> addresses;
            if (ruleset->IsAllowedAll()) {
                addresses.push_back("All");
            } else {
                // Addresses before networks, IPv4 before IPv6; each kind in its stored order.
                auto allowed = ruleset->GetAllowedIps();
                for (const auto& address : allowed->GetIpv4Addresses())
                    addresses.push_back(address.GetStringAddress());
                for (const auto& address : allowed->GetIpv6Addresses())
                    addresses.push_back(address.GetStringAddress());
                for (const auto& network : allowed->GetIpv4Networks())
                    addresses.push_back(network.GetStringAddress());
                for (const auto& network : allowed->GetIpv6Networks())
                    addresses.push_back(network.GetStringAddress());
            }
            record->SetField("Allowed IP Addresses", addresses);
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace

// The firewall's ruleset catalogue on the Linux host: which rulesets there are, their port
// rules, and the state each starts in when the firewall is first loaded. It ships with the
// module (data/firewall-rulesets.json) and is extended by the *.json files of
// /etc/hadro/firewall.d, read in name order:
//
//     {"rulesets": [
//       {"name": "backupAgent",                  // letters, digits and '_', 1 to 48
//        "description": "Backups to this host",  // optional
//        "enabled": false,                       // optional: enabled when first loaded
//        "allowedAll": false,                    // optional: else the allowedIps list
//        "allowedIps": ["192.0.2.0/24"],         // optional: addresses and CIDR networks
//        "rules": [                              // at least one
//          {"direction": "inbound", "protocol": "tcp", "portType": "dst",
//           "portBegin": 9000, "portEnd": 9010}]}]}   // portType "dst" and portEnd portBegin by default
//
// A file's ruleset replaces the shipped ruleset of its name; a name two files define, a name
// that is a word of nft's language (checked by the host when it uses the catalogue), an unknown
// member or a value out of range is refused (HostCtl::Lib::StateFileError naming the
// file, the line and the fault), as the configuration is.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "kernel/nftables.h"

namespace TknCtl::Linux {

struct CatalogueRuleset {
    std::string name;
    std::string description;
    std::vector<Kernel::NftRule> rules;
    bool enabled = false;
    bool allowedAll = true;
    std::vector<std::string> allowedIps;  // canonical (Kernel::CanonicalAllowed)
    std::string origin;                   // the file that defines it; empty for the shipped ones
    int line = 0;                         // where in it
};

struct FirewallCatalogue {
    static constexpr const char* kDirectory = "/etc/hadro/firewall.d";

    std::vector<CatalogueRuleset> rulesets;

    const CatalogueRuleset* Find(const std::string& name) const;

    // The shipped catalogue extended by the files of directory (a missing directory adds none).
    static FirewallCatalogue Load(const std::string& directory = kDirectory);
    // The shipped catalogue alone.
    static FirewallCatalogue Shipped();
    // Adds the rulesets of a file's text; origin names the file in messages.
    void Extend(std::string_view text, const std::string& origin);
};

// Whether a name can be a ruleset's: its chain and sets are named after it, and the
// firewall's own chains are not rulesets.
bool IsRulesetName(const std::string& name);

}  // namespace TknCtl::Linux

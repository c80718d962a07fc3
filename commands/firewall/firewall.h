// The command classes of the host firewall: its status and module ("network firewall ..."),
// its rulesets, their rules, allowed addresses and clients ("network firewall ruleset ...").
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "frame/command.h"
#include "hostctl/system/firewall.h"

namespace TalvexCli::NetworkNamespace {

// ---------------------------------------------------------------- status and module

class FirewallGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallGet)
public:
    std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class FirewallSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallSet)
};

class FirewallLoad : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallLoad)
};

class FirewallRefresh : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallRefresh)
};

class FirewallUnload : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallUnload)
};

// ---------------------------------------------------------------- rulesets

class FirewallRulesetList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallRulesetList)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class FirewallRulesetSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallRulesetSet)
};

class FirewallRulesetRuleList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallRulesetRuleList)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class FirewallRulesetAllowedipList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallRulesetAllowedipList)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class FirewallRulesetAllowedipAdd : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallRulesetAllowedipAdd)
};

class FirewallRulesetAllowedipRemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallRulesetAllowedipRemove)
};

// ---------------------------------------------------------------- ruleset clients

class FirewallRulesetClientGet : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallRulesetClientGet)
public:
    std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class FirewallRulesetClientAdd : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallRulesetClientAdd)
};

class FirewallRulesetClientRemove : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(FirewallRulesetClientRemove)
};

// ---------------------------------------------------------------- shared steps

namespace Firewall {

// The name of the firewall's kernel module.
extern const char* const kModuleName;

// Whether the module is loaded: refreshes the module object first while it is stale, then
// clears its stale flag.
bool IsModuleLoaded(TknCtl::System::ModuleImpl& module);

// The rulesets a listing covers: the one named by an optional "ruleset-id", else all of them
// in the library's order. Returns false after adding the error message ("Ruleset Not Found: "
// or "Failed to check loaded status: " with the id for the lookup of one ruleset; the
// library's message when all of them cannot be listed).
bool SelectRulesets(const Zorbel::CallSpec::Input& input, const OutputPtr& output,
                    TknCtl::System::SystemInfoImpl& system,
                    std::vector<std::unique_ptr<HostCtl::System::FirewallRuleset>>& selection);

// The allowed-list edit of "allowedip add" and "allowedip remove": looks the ruleset up,
// refuses an unknown id, a ruleset that allows all addresses and an empty address, then
// applies edit to the "ip-address" text as given and sets the result.
void UpdateAllowedIp(const Zorbel::CallSpec::Input& input, const OutputPtr& output,
                     const std::function<void(HostCtl::System::FirewallRuleset&, const std::string&)>& edit);

// The ruleset of "ruleset-id" as the client commands reach it (through the host's system
// information); refuses an unknown id, else runs step on it. Failures of the library become
// its message.
void WithClientRuleset(const Zorbel::CallSpec::Input& input, const OutputPtr& output,
                       const std::function<void(HostCtl::System::FirewallRuleset&)>& step);

}  // namespace Firewall

}  // namespace TalvexCli::NetworkNamespace

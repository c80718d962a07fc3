// Each subsystem names the command classes it builds; the tree registration creates one
// object per registration through these factories.
#pragma once

#include <memory>
#include <utility>
#include <vector>

#include "zorbel/autocli.h"

namespace TalvexCli::NetworkNamespace {

using CommandFactory = std::shared_ptr<Zorbel::AutoCli::NamespaceNode> (*)();
using FactoryList = std::vector<std::pair<const char*, CommandFactory>>;

template <typename Class>
std::shared_ptr<Zorbel::AutoCli::NamespaceNode> MakeCommand() {
    return Class::New();
}

// One entry of a subsystem's factory list: {"IpInterfaceList", &MakeCommand<IpInterfaceList>}.
#define NETWORK_FACTORY(Class) \
    { #Class, &::TalvexCli::NetworkNamespace::MakeCommand < Class> }

// The factories of each subsystem (commands/<subsystem>/registry.cpp).
const FactoryList& IpInterfaceFactories();
const FactoryList& IpFactories();
const FactoryList& FirewallFactories();
const FactoryList& EnsFactories();
const FactoryList& NicFactories();
const FactoryList& VswitchStandardFactories();
const FactoryList& DvsFactories();

}  // namespace TalvexCli::NetworkNamespace

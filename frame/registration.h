// The registration of the "network" tree.
#pragma once

#include <memory>

#include "zorbel/autocli.h"

namespace TalvexCli::NetworkNamespace {

// One row of the tree: a namespace (with its description) or a command (with its class).
struct TreeEntry {
    const char* path;
    const char* description;  // namespaces only
    const char* className;    // commands only; registered once its subsystem builds the class
};

// Builds the tree and hangs it under parent as "network".
void RegisterTree(std::shared_ptr<Zorbel::AutoCli::NamespaceNode>& parent);

}  // namespace TalvexCli::NetworkNamespace

extern "C" void AutoCli_RegisterNamespaces(std::shared_ptr<Zorbel::AutoCli::NamespaceNode>& parent);

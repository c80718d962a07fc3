// Shell completion scripts written from the command tree: namespaces, commands, options,
// enumeration values and, for options that name something on the host, the names the host
// has (asked of the program itself at completion time).
#pragma once

#include <string>

#include "zorbel/autocli.h"

namespace Zorbel::Completion {

// The script for shell ("bash" or "zsh").
std::string Script(const std::string& shell, const std::string& program, AutoCli::NamespaceNode& root);

}  // namespace Zorbel::Completion

// The manual of a command tree: a troff man page and a Markdown command reference, both
// written from the registered namespaces, commands and parameter specifications.
#pragma once

#include <string>

#include "zorbel/autocli.h"

namespace Zorbel::Manual {

// The man page (section 1) of the program and every command under root.
std::string ManPage(const std::string& program, AutoCli::NamespaceNode& root);
// The command reference in Markdown.
std::string Reference(const std::string& program, AutoCli::NamespaceNode& root);

}  // namespace Zorbel::Manual

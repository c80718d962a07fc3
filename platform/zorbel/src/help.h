// Help texts: the program's usage, namespace listings and command help, as text and as JSON.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "zorbel/autocli.h"

namespace Zorbel::Help {

std::string ProgramUsage(const std::string& program, AutoCli::NamespaceNode& root);
std::string NamespaceText(const std::string& program, AutoCli::NamespaceNode& node);
std::string NamespaceJson(AutoCli::NamespaceNode& node);
std::string CommandText(const std::string& program, const std::string& path, const AutoCli::Command& command,
                        const CallSpec::InputSpec& input, const CallSpec::OutputSpec* output);
std::string CommandJson(const std::string& path, const AutoCli::Command& command,
                        const CallSpec::InputSpec& input, const CallSpec::OutputSpec* output);
// "Valid choices: a, b, c." for the children of a node.
std::string ValidChoices(AutoCli::NamespaceNode& node);
// The line that follows a refusal.
std::string UsageHint(const std::string& program, const std::string& path);
// The global options and their one-line descriptions, as usage lists them.
std::vector<std::pair<std::string, std::string>> GlobalOptionRows();
// What the help says about a parameter besides its description: "required", "may be
// repeated", its range, allowed values (when the description does not list them) or pattern.
std::vector<std::string> ParameterNotes(const CallSpec::ParameterSpec& parameter);
// The "Output:" part of a command's help: the result's kind and its record's fields.
std::string OutputText(const CallSpec::OutputSpec* output);
// A parameter description with "%ENUM%" and "%FULLENUM%" expanded.
std::string ExpandDescription(const CallSpec::ParameterSpec& parameter);

}  // namespace Zorbel::Help

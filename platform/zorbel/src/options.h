// Checking of command options against a command's parameter specifications.
#pragma once

#include <string>
#include <vector>

#include "zorbel/callspec.h"

namespace Zorbel::Options {

// Fills input from the command options in args. On refusal returns false and sets error to
// one line that names the option as --long and says what is wrong.
bool ParseCommandOptions(const std::vector<std::string>& args, const CallSpec::InputSpec& spec,
                         CallSpec::Input& input, std::string& error);

// Parses a decimal integer with an optional sign that fits in 64 bits.
bool ParseInteger(const std::string& text, std::int64_t& value, bool& overflow);

// Text from the command line as a message shows it: cut when very long, control characters
// escaped.
std::string Shown(const std::string& text);

// true/false, yes/no, on/off, 1/0 in any case.
bool ParseBoolean(const std::string& text, bool& value);

}  // namespace Zorbel::Options

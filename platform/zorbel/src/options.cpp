#include "options.h"

#include <boost/regex.hpp>
#include <charconv>
#include <set>

#include "zorbel/formatter.h"

namespace Zorbel::Options {

using CallSpec::ParameterConstraint;
using CallSpec::ParameterSpec;

namespace {

std::string Lower(const std::string& text) {
    std::string lower = text;
    for (auto& c : lower) {
        if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
    }
    return lower;
}

}  // namespace

// Text from the command line as a message shows it: very long text is cut, control
// characters are escaped (a message must not drive the terminal).
std::string Shown(const std::string& text) {
    constexpr std::size_t limit = 64;
    if (text.size() <= limit) return Format::TerminalSafe(text);
    return Format::TerminalSafe(text.substr(0, limit)) + "...";
}

namespace {

// Quotes a value for a message.
std::string Quote(const std::string& value) {
    return "'" + Shown(value) + "'";
}

std::string JoinInts(const std::vector<long>& values) {
    std::string text;
    for (std::size_t i = 0; i < values.size(); ++i)
        text += (i ? ", " : "") + std::to_string(values[i]);
    return text;
}

// Checks a string value against a string constraint; empty result when it passes.
std::string CheckString(const std::string& option, const std::string& value,
                        const ParameterConstraint* constraint) {
    if (!constraint) return {};
    if (constraint->GetType() == CallSpec::CONSTRAINT_STRING_ENUM) {
        std::string allowed;
        for (const auto& entry : constraint->GetStringEnum()) {
            if (entry.value == value) return {};
            allowed += (allowed.empty() ? "" : ", ") + entry.value;
        }
        return "option " + option + ": " + Quote(value) + " is not one of the allowed values: " + allowed;
    }
    if (constraint->GetType() == CallSpec::CONSTRAINT_STRING_REGEX) {
        bool matched = false;
        try {
            boost::regex expression(constraint->GetRegex());
            matched = boost::regex_match(value, expression);
        } catch (const boost::regex_error&) {
            return "option " + option + ": the command declares an invalid pattern " + constraint->GetRegex();
        } catch (const std::exception&) {
            matched = false;  // too complex to match: not a match
        }
        if (!matched) {
            return "option " + option + ": " + Quote(value) + " does not match the required pattern " +
                   constraint->GetRegex();
        }
    }
    return {};
}

std::string CheckInteger(const std::string& option, std::int64_t value,
                         const ParameterConstraint* constraint) {
    if (!constraint) return {};
    if (constraint->GetType() == CallSpec::CONSTRAINT_INT_RANGE) {
        if (value < constraint->GetRangeLow() || value > constraint->GetRangeHigh()) {
            return "option " + option + ": " + std::to_string(value) + " is not within the range " +
                   std::to_string(constraint->GetRangeLow()) + " to " +
                   std::to_string(constraint->GetRangeHigh());
        }
    } else if (constraint->GetType() == CallSpec::CONSTRAINT_INT_ENUM) {
        for (long allowed : constraint->GetIntEnum()) {
            if (allowed == value) return {};
        }
        return "option " + option + ": " + std::to_string(value) +
               " is not one of the allowed values: " + JoinInts(constraint->GetIntEnum());
    }
    return {};
}

// Checks one value and stores it; empty result when it passes.
std::string Store(const ParameterSpec& spec, const std::string& value, CallSpec::Input& input) {
    const std::string option = "--" + spec.GetName();
    const ParameterConstraint* constraint = spec.GetConstraint().get();
    switch (spec.GetType()) {
        case CallSpec::PARAM_INT: {
            std::int64_t number = 0;
            bool overflow = false;
            if (!ParseInteger(value, number, overflow)) {
                if (overflow)
                    return "option " + option + ": " + Quote(value) + " does not fit in a 64-bit integer";
                return "option " + option + ": " + Quote(value) + " is not an integer";
            }
            std::string problem = CheckInteger(option, number, constraint);
            if (!problem.empty()) return problem;
            input.SetInt(spec.GetName(), value, number);
            return {};
        }
        case CallSpec::PARAM_BOOL: {
            bool flag = false;
            if (!ParseBoolean(value, flag)) {
                return "option " + option + ": " + Quote(value) +
                       " is not a boolean (use true/false, yes/no, on/off or 1/0)";
            }
            input.SetBool(spec.GetName(), value, flag);
            return {};
        }
        case CallSpec::PARAM_STRING_LIST: {
            std::string problem = CheckString(option, value, constraint);
            if (!problem.empty()) return problem;
            input.AppendListValue(spec.GetName(), value);
            return {};
        }
        default: {
            std::string problem = CheckString(option, value, constraint);
            if (!problem.empty()) return problem;
            input.SetString(spec.GetName(), value);
            return {};
        }
    }
}

}  // namespace

bool ParseInteger(const std::string& text, std::int64_t& value, bool& overflow) {
    overflow = false;
    const char* begin = text.data();
    const char* end = begin + text.size();
    if (begin != end && *begin == '+') {
        ++begin;
        if (begin != end && *begin == '-') return false;
    }
    if (begin == end) return false;
    const char* digits = *begin == '-' ? begin + 1 : begin;
    if (digits == end) return false;
    for (const char* p = digits; p != end; ++p) {
        if (*p < '0' || *p > '9') return false;
    }
    auto [ptr, ec] = std::from_chars(begin, end, value);
    if (ec == std::errc::result_out_of_range) {
        overflow = true;
        return false;
    }
    return ec == std::errc() && ptr == end;
}

bool ParseBoolean(const std::string& text, bool& value) {
    const std::string lower = Lower(text);
    if (lower == "true" || lower == "yes" || lower == "on" || lower == "1") {
        value = true;
        return true;
    }
    if (lower == "false" || lower == "no" || lower == "off" || lower == "0") {
        value = false;
        return true;
    }
    return false;
}

bool ParseCommandOptions(const std::vector<std::string>& args, const CallSpec::InputSpec& spec,
                         CallSpec::Input& input, std::string& error) {
    std::set<std::string> seen;
    for (std::size_t i = 0; i < args.size(); ++i) {
        const std::string& arg = args[i];
        std::shared_ptr<ParameterSpec> parameter;
        std::string name;
        std::string value;
        bool inlineValue = false;
        if (arg.size() > 2 && arg[0] == '-' && arg[1] == '-') {
            std::size_t eq = arg.find('=');
            name = arg.substr(2, eq == std::string::npos ? std::string::npos : eq - 2);
            if (eq != std::string::npos) {
                inlineValue = true;
                value = arg.substr(eq + 1);
            }
            parameter = spec.FindParameter(name);
            if (!parameter) {
                error = "unknown option --" + Shown(name);
                if (name == "formatter" || name == "state" || name == "plugin-dir" || name == "backend" ||
                    name == "format-param" || name == "dry-run" || name == "confirm-within" ||
                    name == "confirm" || name == "rollback") {
                    error += " (global options go before the first word)";
                }
                return false;
            }
        } else if (arg.size() > 1 && arg[0] == '-' && arg[1] != '-') {
            std::size_t eq = arg.find('=');
            name = arg.substr(1, eq == std::string::npos ? std::string::npos : eq - 1);
            if (eq != std::string::npos) {
                inlineValue = true;
                value = arg.substr(eq + 1);
            }
            parameter = spec.FindShortParameter(name);
            if (!parameter) {
                error = "unknown option -" + Shown(name);
                return false;
            }
        } else {
            error = "unexpected argument " + Quote(arg);
            return false;
        }

        const std::string option = "--" + parameter->GetName();
        const bool repeatable = parameter->GetType() == CallSpec::PARAM_STRING_LIST;
        if (!repeatable && !seen.insert(parameter->GetName()).second) {
            error = "option " + option + " is given more than once";
            return false;
        }
        if (parameter->GetType() == CallSpec::PARAM_FLAG) {
            if (inlineValue) {
                error = "option " + option + " is a flag and takes no value";
                return false;
            }
            input.SetFlag(parameter->GetName());
            continue;
        }
        if (!inlineValue) {
            // The next word is the value, unless it is another option of this command.
            bool next = i + 1 < args.size();
            if (next) {
                const std::string& candidate = args[i + 1];
                if (candidate == "--help") next = false;
                if (candidate.size() > 2 && candidate[0] == '-' && candidate[1] == '-') {
                    std::size_t eq = candidate.find('=');
                    std::string other =
                        candidate.substr(2, eq == std::string::npos ? std::string::npos : eq - 2);
                    if (spec.FindParameter(other)) next = false;
                }
            }
            if (!next) {
                error = "option " + option + " needs a value";
                return false;
            }
            value = args[++i];
        }
        std::string problem = Store(*parameter, value, input);
        if (!problem.empty()) {
            error = problem;
            return false;
        }
    }
    for (const auto& parameter : spec.GetParameters()) {
        if (parameter->IsRequired() && !input.HasParameter(parameter->GetName())) {
            error = "missing required option --" + parameter->GetName();
            return false;
        }
    }
    return true;
}

}  // namespace Zorbel::Options

#include "help.h"

#include "zorbel/formatter.h"

namespace Zorbel::Help {

using AutoCli::NamespaceNode;
using CallSpec::ParameterConstraint;
using CallSpec::ParameterSpec;
using MetaObj::MetaList;
using MetaObj::MetaObject;
using MetaObj::MetaStruct;

namespace {

constexpr std::size_t kWidth = 80;

void ReplaceAll(std::string& text, const std::string& from, const std::string& to) {
    std::size_t pos = 0;
    while ((pos = text.find(from, pos)) != std::string::npos) {
        text.replace(pos, from.size(), to);
        pos += to.size();
    }
}

// Lines of text wrapped to the help width, each starting with indent blanks.
std::string Indented(const std::string& text, std::size_t indent) {
    std::string out;
    std::size_t width = kWidth > indent + 20 ? kWidth - indent : 20;
    for (const auto& line : Format::WrapText(text, width)) {
        out.append(indent, ' ');
        out += line;
        out += '\n';
    }
    return out;
}

// "  name   description" rows with the descriptions aligned and wrapped.
std::string Listing(const std::vector<std::pair<std::string, std::string>>& rows) {
    std::size_t nameWidth = 0;
    for (const auto& row : rows)
        nameWidth = std::max(nameWidth, row.first.size());
    std::string out;
    const std::size_t column = 2 + nameWidth + 3;
    for (const auto& [name, description] : rows) {
        std::string head = "  " + name;
        head.append(column - head.size(), ' ');
        std::size_t width = kWidth > column + 20 ? kWidth - column : 20;
        auto lines = Format::WrapText(description, width);
        for (std::size_t i = 0; i < lines.size(); ++i) {
            std::string line = (i == 0 ? head : std::string(column, ' ')) + lines[i];
            while (!line.empty() && line.back() == ' ')
                line.pop_back();
            out += line;
            out += '\n';
        }
    }
    return out;
}

std::string Children(NamespaceNode& node, bool commands) {
    std::vector<std::pair<std::string, std::string>> rows;
    for (const auto& name : node.GetNamespaceNodeNames()) {
        auto child = node.GetNamespaceNode(name);
        if ((child->GetType() == AutoCli::NODE_COMMAND) == commands)
            rows.emplace_back(name, child->GetDescription());
    }
    return Listing(rows);
}

std::string EnumValues(const ParameterConstraint& constraint) {
    std::string values;
    for (const auto& entry : constraint.GetStringEnum())
        values += (values.empty() ? "" : ", ") + entry.value;
    for (long value : constraint.GetIntEnum())
        values += (values.empty() ? "" : ", ") + std::to_string(value);
    return values;
}

std::string RangeText(const ParameterConstraint& constraint) {
    return std::to_string(constraint.GetRangeLow()) + " to " + std::to_string(constraint.GetRangeHigh());
}

void AppendChildrenJson(std::string& out, NamespaceNode& node, bool commands) {
    out += '[';
    bool first = true;
    for (const auto& name : node.GetNamespaceNodeNames()) {
        auto child = node.GetNamespaceNode(name);
        if ((child->GetType() == AutoCli::NODE_COMMAND) != commands) continue;
        if (!first) out += ',';
        first = false;
        out += "{\"name\":";
        Format::AppendJsonString(out, name);
        out += ",\"description\":";
        Format::AppendJsonString(out, child->GetDescription());
        out += '}';
    }
    out += ']';
}

const char* ValueTypeName(const MetaObject* value) {
    if (!value) return "none";
    switch (value->GetType()) {
        case MetaObj::META_STRING:
            return "string";
        case MetaObj::META_INT:
            return "integer";
        case MetaObj::META_BOOL:
            return "boolean";
        case MetaObj::META_STRUCT:
            return "record";
        case MetaObj::META_LIST:
            return static_cast<const MetaList*>(value)->GetElementType() == MetaObj::META_STRUCT
                       ? "list"
                       : "string-list";
    }
    return "none";
}

// The record a value stands for: itself, or a list's prototype.
const MetaStruct* RecordOf(const MetaObject* value) {
    if (!value) return nullptr;
    if (value->GetType() == MetaObj::META_STRUCT) return static_cast<const MetaStruct*>(value);
    if (value->GetType() == MetaObj::META_LIST)
        return static_cast<const MetaList*>(value)->GetPrototype().get();
    return nullptr;
}

void AppendFieldsJson(std::string& out, const MetaStruct& record) {
    out += ",\"record\":";
    Format::AppendJsonString(out, record.GetName());
    out += ",\"fields\":[";
    bool first = true;
    for (const auto& [name, value] : record.GetFields()) {
        if (!first) out += ',';
        first = false;
        out += "{\"name\":";
        Format::AppendJsonString(out, name);
        out += ",\"type\":";
        Format::AppendJsonString(out, ValueTypeName(value.get()));
        if (const MetaStruct* nested = RecordOf(value.get())) AppendFieldsJson(out, *nested);
        out += '}';
    }
    out += ']';
}

void AppendOutputJson(std::string& out, const CallSpec::OutputSpec* output) {
    const MetaObject* root = output ? output->GetRootObject().get() : nullptr;
    out += "{\"kind\":";
    Format::AppendJsonString(out, ValueTypeName(root));
    if (const MetaStruct* record = RecordOf(root)) AppendFieldsJson(out, *record);
    out += '}';
}

void AppendFieldsText(std::string& out, const MetaStruct& record, std::size_t indent) {
    for (const auto& [name, value] : record.GetFields()) {
        out.append(indent, ' ');
        out += name + ": " + ValueTypeName(value.get());
        const MetaStruct* nested = RecordOf(value.get());
        if (nested) out += " of " + nested->GetName();
        out += '\n';
        if (nested) AppendFieldsText(out, *nested, indent + 3);
    }
}

std::string OutputTextOf(const CallSpec::OutputSpec* output) {
    const MetaObject* root = output ? output->GetRootObject().get() : nullptr;
    std::string out;
    if (!root) return "  none\n";
    switch (root->GetType()) {
        case MetaObj::META_BOOL:
            return "  boolean (true on success)\n";
        case MetaObj::META_INT:
            return "  integer\n";
        case MetaObj::META_STRING:
            return "  string\n";
        case MetaObj::META_STRUCT:
            out = "  record " + static_cast<const MetaStruct*>(root)->GetName() + "\n";
            break;
        case MetaObj::META_LIST: {
            const MetaStruct* record = RecordOf(root);
            if (!record) return "  list of strings\n";
            out = "  list of " + record->GetName() + " records\n";
            break;
        }
    }
    if (const MetaStruct* record = RecordOf(root)) AppendFieldsText(out, *record, 5);
    return out;
}

}  // namespace

std::string ExpandDescription(const ParameterSpec& parameter) {
    std::string text = parameter.GetDescription();
    const ParameterConstraint* constraint = parameter.GetConstraint().get();
    if (text.find('%') == std::string::npos) return text;
    std::string values = constraint ? EnumValues(*constraint) : std::string();
    std::string full;
    if (constraint) {
        for (const auto& entry : constraint->GetStringEnum()) {
            full += "\n    " + entry.value;
            if (!entry.help.empty()) full += ": " + entry.help;
        }
        for (long value : constraint->GetIntEnum())
            full += "\n    " + std::to_string(value);
    }
    ReplaceAll(text, "%FULLENUM%", full);
    ReplaceAll(text, "%ENUM%", "[" + values + "]");
    return text;
}

std::string OutputText(const CallSpec::OutputSpec* output) {
    return OutputTextOf(output);
}

std::string ValidChoices(NamespaceNode& node) {
    std::string text = "Valid choices: ";
    auto names = node.GetNamespaceNodeNames();
    for (std::size_t i = 0; i < names.size(); ++i)
        text += (i ? ", " : "") + names[i];
    if (names.empty()) text += "none";
    return text + ".";
}

std::string UsageHint(const std::string& program, const std::string& path) {
    std::string target = path.empty() ? program : program + " " + path;
    return "Usage: " + target + (path.empty() ? " NAMESPACE... COMMAND [options]" : " [options]") +
           "; see '" + target + " --help'.\n";
}

std::vector<std::pair<std::string, std::string>> GlobalOptionRows() {
    return {
        {"--formatter=NAME",
         "Output format: simple, table, json, xml, csv or keyvalue (default: the command's own, else "
         "simple)."},
        {"--format-param=KEY=VALUE",
         "Display parameter, repeatable: fields=A,B (choose and order the fields), show-header=false "
         "(table, csv)."},
        {"--backend=HOST",
         "The host to manage: simulated (its whole state in one file) or linux (the network of this "
         "machine); default: $HADRO_BACKEND, else simulated."},
        {"--state=PATH",
         "Simulated host state file (default: $HADRO_STATE, else $XDG_STATE_HOME/hadro/host.json)."},
        {"--plugin-dir=DIR",
         "Load plug-ins from DIR (default: $HADRO_PLUGIN_PATH, else the installed ones)."},
        {"--list-commands", "List every command with its description."},
        {"--batch=FILE",
         "Run the command lines of FILE (- for standard input), one per line, in one session."},
        {"--atomic", "With --batch: every line must succeed, else nothing is changed."},
        {"--dry-run",
         "Check the command and list the host-control calls it would make (on a Linux host also each "
         "kernel request) instead of its result; nothing is changed."},
        {"--confirm-within=SECONDS",
         "Linux host: a checkpoint is taken before the change, and restored by itself after SECONDS (1 to "
         "86400) unless --confirm runs first."},
        {"--confirm", "Linux host: keep the changes made since the pending checkpoint."},
        {"--rollback", "Linux host: restore the pending checkpoint now."},
        {"--manual[=markdown]",
         "Write the manual page (troff) of every command; with =markdown, the command reference in "
         "Markdown."},
        {"--completion=SHELL", "Write the completion script for bash or zsh."},
        {"--help, -h", "Show this help; after a namespace or command, its help."},
        {"--version", "Show the version."},
    };
}

std::string ProgramUsage(const std::string& program, NamespaceNode& root) {
    std::string out = "Usage: " + program + " [global options] NAMESPACE... COMMAND [command options]\n\n";
    out += "Global options:\n";
    out += Listing(GlobalOptionRows());
    out += "\nAvailable Namespaces:\n";
    out += Children(root, false);
    std::string commands = Children(root, true);
    if (!commands.empty()) out += "\nAvailable Commands:\n" + commands;
    return out;
}

std::string NamespaceText(const std::string& program, NamespaceNode& node) {
    std::string path = node.GetPathString(' ');
    std::string out = "Usage: " + program + " " + path + " {cmd} [cmd options]\n\n";
    out += "Description:\n";
    out += Indented(node.GetDescription(), 2);
    std::string namespaces = Children(node, false);
    if (!namespaces.empty()) out += "\nAvailable Namespaces:\n" + namespaces;
    std::string commands = Children(node, true);
    if (!commands.empty()) out += "\nAvailable Commands:\n" + commands;
    return out;
}

std::string NamespaceJson(NamespaceNode& node) {
    std::string out = "{\"path\":";
    Format::AppendJsonString(out, node.GetPathString(' '));
    out += ",\"description\":";
    Format::AppendJsonString(out, node.GetDescription());
    out += ",\"namespaces\":";
    AppendChildrenJson(out, node, false);
    out += ",\"commands\":";
    AppendChildrenJson(out, node, true);
    out += "}\n";
    return out;
}

std::vector<std::string> ParameterNotes(const ParameterSpec& parameter) {
    std::vector<std::string> notes;
    if (parameter.IsRequired()) notes.push_back("required");
    if (parameter.GetType() == CallSpec::PARAM_STRING_LIST) notes.push_back("may be repeated");
    if (const auto& constraint = parameter.GetConstraint()) {
        const bool listed = parameter.GetDescription().find("ENUM%") != std::string::npos;
        switch (constraint->GetType()) {
            case CallSpec::CONSTRAINT_INT_RANGE:
                notes.push_back(RangeText(*constraint));
                break;
            case CallSpec::CONSTRAINT_INT_ENUM:
            case CallSpec::CONSTRAINT_STRING_ENUM:
                if (!listed) notes.push_back("one of: " + EnumValues(*constraint));
                break;
            case CallSpec::CONSTRAINT_STRING_REGEX:
                notes.push_back("pattern: " + constraint->GetRegex());
                break;
            default:
                break;
        }
    }
    return notes;
}

std::string CommandText(const std::string& program, const std::string& path, const AutoCli::Command& command,
                        const CallSpec::InputSpec& input, const CallSpec::OutputSpec* output) {
    std::string out = "Usage: " + program + " " + path + " [cmd options]\n\n";
    out += "Description:\n";
    out += Listing({{command.GetName(), command.GetDescription()}});
    out += "\nCmd options:\n";
    if (input.GetParameters().empty()) out += "  none\n";
    for (const auto& parameter : input.GetParameters()) {
        std::string head = "  ";
        if (!parameter->GetShortName().empty()) head += "-" + parameter->GetShortName() + "|";
        head += "--" + parameter->GetName();
        if (parameter->GetType() != CallSpec::PARAM_FLAG) {
            head += "=<" + std::string(CallSpec::ParameterTypeName(parameter->GetType())) + ">";
        }
        std::vector<std::string> notes = ParameterNotes(*parameter);
        if (!notes.empty()) {
            head += "  (";
            for (std::size_t i = 0; i < notes.size(); ++i)
                head += (i ? ", " : "") + notes[i];
            head += ")";
        }
        out += head + "\n";
        std::string description = ExpandDescription(*parameter);
        // Expanded enumerations come on lines of their own.
        std::size_t cut = description.find("\n    ");
        out += Indented(description.substr(0, cut), 8);
        if (cut != std::string::npos) {
            std::string rest = description.substr(cut + 1);
            std::size_t start = 0;
            while (start < rest.size()) {
                std::size_t end = rest.find('\n', start);
                if (end == std::string::npos) end = rest.size();
                out += Indented(rest.substr(start, end - start), 10);
                start = end + 1;
            }
        }
    }
    out += "\nOutput:\n";
    out += OutputTextOf(output);
    return out;
}

std::string CommandJson(const std::string& path, const AutoCli::Command& command,
                        const CallSpec::InputSpec& input, const CallSpec::OutputSpec* output) {
    std::string out = "{\"path\":";
    Format::AppendJsonString(out, path);
    out += ",\"description\":";
    Format::AppendJsonString(out, command.GetDescription());
    out += ",\"parameters\":[";
    bool first = true;
    for (const auto& parameter : input.GetParameters()) {
        if (!first) out += ',';
        first = false;
        out += "{\"name\":";
        Format::AppendJsonString(out, parameter->GetName());
        out += ",\"short\":";
        Format::AppendJsonString(out, parameter->GetShortName());
        out += ",\"type\":";
        Format::AppendJsonString(out, CallSpec::ParameterTypeName(parameter->GetType()));
        out += ",\"required\":";
        out += parameter->IsRequired() ? "true" : "false";
        out += ",\"description\":";
        Format::AppendJsonString(out, ExpandDescription(*parameter));
        if (const auto& constraint = parameter->GetConstraint()) {
            out += ",\"constraint\":";
            switch (constraint->GetType()) {
                case CallSpec::CONSTRAINT_INT_RANGE:
                    out += "{\"kind\":\"range\",\"min\":" + std::to_string(constraint->GetRangeLow()) +
                           ",\"max\":" + std::to_string(constraint->GetRangeHigh()) + "}";
                    break;
                case CallSpec::CONSTRAINT_INT_ENUM: {
                    out += "{\"kind\":\"enum\",\"values\":[";
                    const auto& values = constraint->GetIntEnum();
                    for (std::size_t i = 0; i < values.size(); ++i)
                        out += (i ? "," : "") + std::to_string(values[i]);
                    out += "]}";
                    break;
                }
                case CallSpec::CONSTRAINT_STRING_ENUM: {
                    out += "{\"kind\":\"enum\",\"values\":[";
                    const auto& values = constraint->GetStringEnum();
                    for (std::size_t i = 0; i < values.size(); ++i) {
                        if (i) out += ',';
                        out += "{\"value\":";
                        Format::AppendJsonString(out, values[i].value);
                        out += ",\"help\":";
                        Format::AppendJsonString(out, values[i].help);
                        out += '}';
                    }
                    out += "]}";
                    break;
                }
                case CallSpec::CONSTRAINT_STRING_REGEX:
                    out += "{\"kind\":\"regex\",\"pattern\":";
                    Format::AppendJsonString(out, constraint->GetRegex());
                    out += '}';
                    break;
                default:
                    out += "null";
            }
        }
        out += '}';
    }
    out += "],\"output\":";
    AppendOutputJson(out, output);
    out += ",\"metadata\":{";
    first = true;
    for (const auto& [key, value] : command.GetMetaDataFields()) {
        if (!first) out += ',';
        first = false;
        Format::AppendJsonString(out, key);
        out += ':';
        Format::AppendJsonString(out, value);
    }
    out += "},\"formatter\":";
    Format::AppendJsonString(out, command.GetDefaultOutputFormatter());
    out += ",\"output-parameters\":[";
    first = true;
    for (const auto& [key, value] : command.GetDefaultOutputParameters()) {
        if (!first) out += ',';
        first = false;
        out += "{\"key\":";
        Format::AppendJsonString(out, key);
        out += ",\"value\":";
        Format::AppendJsonString(out, value);
        out += '}';
    }
    out += "]}\n";
    return out;
}

}  // namespace Zorbel::Help

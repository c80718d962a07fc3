#include "manual.h"

#include <algorithm>
#include <vector>

#include "help.h"

#ifndef HADRO_VERSION
#define HADRO_VERSION "0.0.0"
#endif

namespace Zorbel::Manual {

using AutoCli::Command;
using AutoCli::NamespaceNode;
using CallSpec::ParameterSpec;

namespace {

// The nodes of the tree in registration order, depth first.
struct Entry {
    std::string path;
    std::shared_ptr<NamespaceNode> node;
    bool command = false;
};

void Collect(const std::shared_ptr<NamespaceNode>& node, const std::string& prefix, std::vector<Entry>& out) {
    for (const auto& name : node->GetNamespaceNodeNames()) {
        auto child = node->GetNamespaceNode(name);
        if (!child) continue;
        std::string path = prefix.empty() ? name : prefix + " " + name;
        bool command = child->GetType() == AutoCli::NODE_COMMAND;
        out.push_back({path, child, command});
        if (!command) Collect(child, path, out);
    }
}

std::vector<Entry> Entries(NamespaceNode& root) {
    std::vector<Entry> entries;
    Collect(root.GetThis(), "", entries);
    return entries;
}

std::vector<std::string> Lines(const std::string& text) {
    std::vector<std::string> lines;
    std::size_t start = 0;
    while (start <= text.size()) {
        std::size_t end = text.find('\n', start);
        if (end == std::string::npos) end = text.size();
        lines.push_back(text.substr(start, end - start));
        start = end + 1;
    }
    while (!lines.empty() && lines.back().empty())
        lines.pop_back();
    return lines;
}

std::string Joined(const std::vector<std::string>& items, const char* separator) {
    std::string text;
    for (std::size_t i = 0; i < items.size(); ++i)
        text += (i ? separator : "") + items[i];
    return text;
}

// Parameter heading parts shared by both outputs: "-s|--long=<type>" and its notes.
std::string TypeOf(const ParameterSpec& parameter) {
    return CallSpec::ParameterTypeName(parameter.GetType());
}

// ---------------------------------------------------------------- troff

// Text for a troff line: backslashes escaped, hyphens as minus signs where they are part of
// an option, and a line that would start a request (with '.' or '\'') protected.
std::string Roff(const std::string& text) {
    std::string out;
    for (std::size_t i = 0; i < text.size(); ++i) {
        char c = text[i];
        if (c == '\\') {
            out += "\\e";
        } else if (c == '-') {
            out += "\\-";
        } else {
            out += c;
        }
    }
    if (!out.empty() && (out[0] == '.' || out[0] == '\'')) out = "\\&" + out;
    return out;
}

// Lines of text as troff input, each protected; empty lines dropped (they would be blank
// lines in the output).
std::string RoffLines(const std::string& text) {
    std::string out;
    bool first = true;
    for (const auto& line : Lines(text)) {
        std::string trimmed = line;
        std::size_t lead = trimmed.find_first_not_of(' ');
        if (lead == std::string::npos) continue;
        if (!first) out += ".br\n";
        first = false;
        out += Roff(trimmed.substr(lead)) + "\n";
    }
    return out;
}

std::string Quoted(const std::string& text) {
    std::string out = "\"";
    for (char c : Roff(text))
        out += c == '"' ? std::string("\\(dq") : std::string(1, c);
    return out + "\"";
}

}  // namespace

std::string ManPage(const std::string& program, NamespaceNode& root) {
    std::string upper;
    for (char c : program)
        upper += static_cast<char>(c >= 'a' && c <= 'z' ? c - 'a' + 'A' : c);
    std::string out;
    out += ".\\\" Written by " + program + " --manual from the registered commands.\n";
    out += ".TH " + upper + " 1 \"\" " + Quoted(program + " " HADRO_VERSION) + " \"Host administration\"\n";
    out += ".SH NAME\n" + Roff(program) + " \\- the administrative command line of a Hadro host\n";
    out += ".SH SYNOPSIS\n.B " + Roff(program) +
           "\n[\\fIglobal options\\fR] \\fINAMESPACE\\fR... \\fICOMMAND\\fR [\\fIcommand options\\fR]\n";
    out +=
        ".SH DESCRIPTION\n"
        "Words name namespaces and finally a command. Command options take the forms\n"
        "\\fB\\-\\-name=value\\fR, \\fB\\-\\-name value\\fR, \\fB\\-n value\\fR and \\fB\\-n=value\\fR; a "
        "flag "
        "takes no value;\n"
        "a boolean takes true/false, yes/no, on/off or 1/0; a string list is given by repeating the "
        "option.\n"
        "Results go to standard output, rendered by the formatter; error messages go to standard error.\n";
    out += ".SH GLOBAL OPTIONS\nThese stand before the first word.\n";
    for (const auto& [option, description] : Help::GlobalOptionRows()) {
        out += ".TP\n.B " + Roff(option) + "\n" + RoffLines(description);
    }
    out += ".SH COMMANDS\n";
    for (const auto& entry : Entries(root)) {
        if (!entry.command) continue;
        auto command = std::dynamic_pointer_cast<Command>(entry.node);
        if (!command) continue;
        out += ".SS " + Quoted(program + " " + entry.path) + "\n";
        out += RoffLines(command->GetDescription());
        auto input = command->GetInputSpec();
        if (input && !input->GetParameters().empty()) {
            out += ".PP\nOptions:\n";
            for (const auto& parameter : input->GetParameters()) {
                std::string head;
                if (!parameter->GetShortName().empty())
                    head += "\\fB" + Roff("-" + parameter->GetShortName()) + "\\fR, ";
                head += "\\fB" + Roff("--" + parameter->GetName()) + "\\fR";
                if (parameter->GetType() != CallSpec::PARAM_FLAG)
                    head += "=\\fI" + TypeOf(*parameter) + "\\fR";
                auto notes = Help::ParameterNotes(*parameter);
                if (!notes.empty()) head += " (" + Roff(Joined(notes, ", ")) + ")";
                out += ".TP\n" + head + "\n" + RoffLines(Help::ExpandDescription(*parameter));
            }
        }
        out += ".PP\nOutput:\n.nf\n";
        auto output = command->GetOutputSpec();
        for (const auto& line : Lines(Help::OutputText(output.get())))
            out += Roff(line) + "\n";
        out += ".fi\n";
    }
    out +=
        ".SH EXIT STATUS\n"
        ".TP\n.B 0\nsuccess\n"
        ".TP\n.B 1\nthe command reported an error, or its result is false\n"
        ".TP\n.B 2\nthe command line was refused; nothing ran\n"
        ".TP\n.B 3\nan unexpected failure (an unreadable or unwritable state file, output that cannot be "
        "written, an unhandled error); a change already committed stays committed\n";
    out +=
        ".SH ENVIRONMENT\n"
        ".TP\n.B HADRO_BACKEND\nthe host to manage (\\fBsimulated\\fR or \\fBlinux\\fR) when "
        "\\fB\\-\\-backend\\fR is not given\n"
        ".TP\n.B HADRO_STATE\nthe simulated host's state file when \\fB\\-\\-state\\fR is not given\n"
        ".TP\n.B HADRO_LINUX_CONF\nthe Linux host's configuration (default \\fI/etc/hadro/linux.conf\\fR)\n"
        ".TP\n.B HADRO_LINUX_STATE\nthe Linux host's own document (default "
        "\\fI/var/lib/hadro/linux.json\\fR)\n"
        ".TP\n.B HADRO_PLUGIN_PATH\nplug-in directories, colon-separated, when \\fB\\-\\-plugin\\-dir\\fR is "
        "not "
        "given\n"
        ".TP\n.B COLUMNS\nthe terminal width for wrapped table columns\n";
    out +=
        ".SH FILES\n"
        ".TP\n.I $XDG_STATE_HOME/hadro/host.json\nthe default host state file "
        "(\\fI~/.local/state/hadro/host.json\\fR when XDG_STATE_HOME is not set)\n"
        ".TP\n.I /var/lib/hadro/linux.json.checkpoint/\nthe Linux host's pending checkpoint, beside its "
        "document: what \\fB\\-\\-rollback\\fR restores\n";
    return out;
}

// ---------------------------------------------------------------- Markdown

namespace {

// Text that Markdown would otherwise read as markup.
std::string Markdown(const std::string& text) {
    std::string out;
    for (char c : text) {
        if (c == '\\' || c == '*' || c == '_' || c == '`' || c == '<' || c == '>' || c == '[' || c == ']' ||
            c == '|' || c == '#') {
            out += '\\';
        }
        out += c;
    }
    return out;
}

// A GitHub-style anchor for a heading.
std::string Anchor(const std::string& text) {
    std::string out;
    for (char c : text) {
        if ((c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '-' || c == '_') {
            out += c;
        } else if (c >= 'A' && c <= 'Z') {
            out += static_cast<char>(c - 'A' + 'a');
        } else if (c == ' ') {
            out += '-';
        }
    }
    return out;
}

// Lines of a description: the first as a paragraph, the others (listed values) as a list.
std::string MarkdownText(const std::string& text, const std::string& indent) {
    std::string out;
    bool first = true;
    for (const auto& line : Lines(text)) {
        std::size_t lead = line.find_first_not_of(' ');
        if (lead == std::string::npos) continue;
        std::size_t end = line.find_last_not_of(' ');
        out += first ? std::string() : "\n" + indent + "- ";
        out += Markdown(line.substr(lead, end + 1 - lead));
        first = false;
    }
    return out;
}

}  // namespace

std::string Reference(const std::string& program, NamespaceNode& root) {
    auto entries = Entries(root);
    std::string out = "# " + program + " command reference\n\n";
    out += "<!-- Written by `" + program +
           " --manual=markdown` from the registered commands; do not edit by hand. -->\n\n";
    out += "Global options stand before the first word:\n\n";
    for (const auto& [option, description] : Help::GlobalOptionRows())
        out += "- `" + option + "`: " + Markdown(description) + "\n";
    out += "\n## Commands\n\n";
    for (const auto& entry : entries) {
        std::size_t depth = static_cast<std::size_t>(std::count(entry.path.begin(), entry.path.end(), ' '));
        std::string indent(2 * depth, ' ');
        if (entry.command) {
            std::string title = program + " " + entry.path;
            out += indent + "- [" + entry.node->GetName() + "](#" + Anchor(title) + ")\n";
        } else {
            out += indent + "- " + entry.node->GetName() + ": " +
                   MarkdownText(entry.node->GetDescription(), "") + "\n";
        }
    }
    for (const auto& entry : entries) {
        if (!entry.command) continue;
        auto command = std::dynamic_pointer_cast<Command>(entry.node);
        if (!command) continue;
        out += "\n## " + program + " " + entry.path + "\n\n";
        out += MarkdownText(command->GetDescription(), "") + "\n\n";
        auto input = command->GetInputSpec();
        if (input && !input->GetParameters().empty()) {
            out += "Options:\n\n";
            for (const auto& parameter : input->GetParameters()) {
                out += "- ";
                if (!parameter->GetShortName().empty()) out += "`-" + parameter->GetShortName() + "`, ";
                out += "`--" + parameter->GetName() + "`";
                out += " (" + TypeOf(*parameter);
                for (const auto& note : Help::ParameterNotes(*parameter))
                    out += ", " + Markdown(note);
                std::string description = MarkdownText(Help::ExpandDescription(*parameter), "  ");
                out += description.empty() ? ")\n" : "): " + description + "\n";
            }
            out += "\n";
        } else {
            out += "Options: none.\n\n";
        }
        out += "Output:\n\n```\n";
        auto output = command->GetOutputSpec();
        out += Help::OutputText(output.get());
        out += "```\n";
    }
    return out;
}

}  // namespace Zorbel::Manual

#include "zorbel/dispatcher.h"

#include <dirent.h>
#include <dlfcn.h>

#include <algorithm>
#include <charconv>
#include <exception>
#include <ostream>

#include "completion.h"
#include "help.h"
#include "manual.h"
#include "options.h"
#include "zorbel/formatter.h"

#ifndef HADRO_VERSION
#define HADRO_VERSION "0.0.0"
#endif

namespace Zorbel::AutoCli {

namespace {

bool StartsWith(const std::string& text, const char* prefix) {
    return text.rfind(prefix, 0) == 0;
}

// Reads "--name=value" or "--name value" for a global option; true when arg is that option.
bool TakeGlobalValue(const std::vector<std::string>& args, std::size_t& i, const std::string& name,
                     std::string& value, std::string& error) {
    const std::string& arg = args[i];
    const std::string flag = "--" + name;
    if (arg == flag) {
        if (i + 1 >= args.size()) {
            error = "option " + flag + " needs a value";
            return true;
        }
        value = args[++i];
        return true;
    }
    if (StartsWith(arg, (flag + "=").c_str())) {
        value = arg.substr(flag.size() + 1);
        return true;
    }
    return false;
}

void CollectCommands(const std::shared_ptr<NamespaceNode>& node, const std::string& prefix,
                     std::vector<std::pair<std::string, std::shared_ptr<Command>>>& out) {
    for (const auto& name : node->GetNamespaceNodeNames()) {
        auto child = node->GetNamespaceNode(name);
        std::string path = prefix.empty() ? name : prefix + " " + name;
        if (child->GetType() == NODE_COMMAND) {
            if (auto command = std::dynamic_pointer_cast<Command>(child)) out.emplace_back(path, command);
        } else {
            CollectCommands(child, path, out);
        }
    }
}

}  // namespace

bool ParseGlobalOptions(const std::vector<std::string>& args, GlobalOptions& options,
                        std::vector<std::string>& rest, std::string& error) {
    std::size_t i = 0;
    for (; i < args.size(); ++i) {
        const std::string& arg = args[i];
        if (arg.empty() || arg[0] != '-') break;
        std::string value;
        if (TakeGlobalValue(args, i, "formatter", value, error)) {
            if (!error.empty()) return false;
            if (!Format::IsFormatter(value)) {
                error = "unknown formatter '" + Options::Shown(value) + "' for --formatter (choose from ";
                const auto& names = Format::FormatterNames();
                for (std::size_t k = 0; k < names.size(); ++k)
                    error += (k ? ", " : "") + names[k];
                error += ")";
                return false;
            }
            options.formatter = value;
            options.formatterGiven = true;
        } else if (TakeGlobalValue(args, i, "state", value, error)) {
            if (!error.empty()) return false;
            if (value.empty()) {
                error = "option --state needs a file name";
                return false;
            }
            options.statePath = value;
        } else if (TakeGlobalValue(args, i, "backend", value, error)) {
            if (!error.empty()) return false;
            if (value.empty()) {
                error = "option --backend needs a host: simulated or linux";
                return false;
            }
            options.backend = value;
        } else if (TakeGlobalValue(args, i, "plugin-dir", value, error)) {
            if (!error.empty()) return false;
            options.pluginDirs.push_back(value);
        } else if (TakeGlobalValue(args, i, "format-param", value, error)) {
            if (!error.empty()) return false;
            auto eq = value.find('=');
            if (eq == std::string::npos || eq == 0) {
                error = "option --format-param needs KEY=VALUE, got '" + Options::Shown(value) + "'";
                return false;
            }
            std::string key = value.substr(0, eq), setting = value.substr(eq + 1);
            if (error = Format::CheckFormatParameter(key, setting); !error.empty()) return false;
            options.formatParameters.emplace_back(key, setting);
        } else if (TakeGlobalValue(args, i, "batch", value, error)) {
            if (!error.empty()) return false;
            if (value.empty()) {
                error = "option --batch needs a file name (or - for standard input)";
                return false;
            }
            options.batch = value;
        } else if (arg == "--atomic") {
            options.atomic = true;
        } else if (arg == "--dry-run") {
            options.dryRun = true;
        } else if (TakeGlobalValue(args, i, "confirm-within", value, error)) {
            if (!error.empty()) return false;
            unsigned seconds = 0;
            auto [end, fault] = std::from_chars(value.data(), value.data() + value.size(), seconds);
            if (value.empty() || fault != std::errc() || end != value.data() + value.size() || seconds < 1 ||
                seconds > kMaxConfirmWithin) {
                error = "option --confirm-within needs a number of seconds from 1 to " +
                        std::to_string(kMaxConfirmWithin) + ", got '" + Options::Shown(value) + "'";
                return false;
            }
            options.confirmWithin = seconds;
        } else if (arg == "--confirm") {
            options.confirm = true;
        } else if (arg == "--rollback") {
            options.rollback = true;
        } else if (arg == "--manual") {
            options.manual = "man";
        } else if (StartsWith(arg, "--manual=")) {
            options.manual = arg.substr(9);
            if (options.manual != "man" && options.manual != "markdown") {
                error = "unknown manual format '" + Options::Shown(options.manual) +
                        "' for --manual (choose from man, markdown)";
                return false;
            }
        } else if (TakeGlobalValue(args, i, "completion", value, error)) {
            if (!error.empty()) return false;
            if (value != "bash" && value != "zsh") {
                error =
                    "unknown shell '" + Options::Shown(value) + "' for --completion (choose from bash, zsh)";
                return false;
            }
            options.completion = value;
        } else if (arg == "--list-commands") {
            options.listCommands = true;
        } else if (arg == "--help" || arg == "-h") {
            options.help = true;
        } else if (arg == "--version") {
            options.version = true;
        } else {
            error = "unknown global option " + Options::Shown(arg);
            return false;
        }
    }
    rest.assign(args.begin() + static_cast<std::ptrdiff_t>(i), args.end());
    return true;
}

std::shared_ptr<Dispatcher> Dispatcher::New(std::string programName) {
    auto dispatcher = std::make_shared<Dispatcher>(std::move(programName));
    dispatcher->root_->dispatcher_ = dispatcher;
    return dispatcher;
}

Dispatcher::Dispatcher(std::string programName)
    : programName_(std::move(programName)), root_(Namespace::New()) {}

int Dispatcher::LoadPluginDirectories(const std::vector<std::string>& dirs, std::ostream& err) {
    int loaded = 0;
    for (const auto& dir : dirs) {
        DIR* handle = opendir(dir.c_str());
        if (!handle) continue;
        std::vector<std::string> files;
        while (dirent* entry = readdir(handle)) {
            std::string name = entry->d_name;
            if (name.size() > 3 && name.compare(name.size() - 3, 3, ".so") == 0) files.push_back(name);
        }
        closedir(handle);
        std::sort(files.begin(), files.end());
        for (const auto& file : files) {
            std::string error;
            std::string path = dir + "/" + file;
            if (LoadPlugin(path, error)) {
                ++loaded;
            } else {
                err << "Warning: plug-in " << Format::TerminalSafe(path)
                    << " not loaded: " << Format::TerminalSafeLines(error) << '\n';
            }
        }
    }
    return loaded;
}

bool Dispatcher::LoadPlugin(const std::string& path, std::string& error) {
    // Plug-ins stay loaded for the life of the process: the tree holds their objects.
    void* handle = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (!handle) {
        const char* text = dlerror();
        error = text ? text : "cannot be opened";
        return false;
    }
    using RegisterFunction = void (*)(std::shared_ptr<NamespaceNode>&);
    auto* function = reinterpret_cast<RegisterFunction>(dlsym(handle, "AutoCli_RegisterNamespaces"));
    if (!function) {
        error = "it has no entry point AutoCli_RegisterNamespaces";
        return false;
    }
    try {
        function(root_);
    } catch (const std::exception& e) {
        error = std::string("its registration failed: ") + e.what();
        return false;
    } catch (...) {
        error = "its registration failed";
        return false;
    }
    return true;
}

std::vector<std::pair<std::string, std::shared_ptr<Command>>> Dispatcher::ListCommands() const {
    std::vector<std::pair<std::string, std::shared_ptr<Command>>> commands;
    CollectCommands(root_, "", commands);
    return commands;
}

void Dispatcher::WriteCommandList(const GlobalOptions& options, std::ostream& out) const {
    auto commands = ListCommands();
    std::string text;
    if (options.formatter == "json") {
        text += '[';
        for (std::size_t i = 0; i < commands.size(); ++i) {
            if (i) text += ',';
            text += "{\"path\":";
            Format::AppendJsonString(text, commands[i].first);
            text += ",\"description\":";
            Format::AppendJsonString(text, commands[i].second->GetDescription());
            text += '}';
        }
        text += "]\n";
    } else if (options.formatter == "xml" || options.formatter == "csv" || options.formatter == "keyvalue") {
        // The machine formats: one record per command, fields "path" and "description".
        auto list = MetaObj::MetaList::New(MetaObj::META_STRUCT);
        for (const auto& [path, command] : commands) {
            auto record = MetaObj::MetaStruct::New("Command");
            record->SetField("path", path);
            record->SetField("description", command->GetDescription());
            list->Add(record);
        }
        Format::Render(options.formatter, *list, Format::OutputParameters(options.formatParameters), text);
    } else {
        for (const auto& [path, command] : commands) {
            text += path;
            text += '\t';
            // One line per command: a description of several lines is joined with blanks.
            std::string description = command->GetDescription();
            while (!description.empty() && (description.back() == '\n' || description.back() == ' ')) {
                description.pop_back();
            }
            for (char& c : description) {
                if (c == '\n') c = ' ';
            }
            text += description;
            text += '\n';
        }
    }
    out << text;
}

void Dispatcher::WriteUsage(std::ostream& out) const {
    out << Help::ProgramUsage(programName_, *root_);
}

int Dispatcher::StatusOf(const CallSpec::Output& output) {
    if (output.HasError()) return EXIT_FAILED;
    const auto& root = output.GetRootObject();
    if (root && root->GetType() == MetaObj::META_BOOL && !static_cast<const MetaObj::MetaBool&>(*root).Get())
        return EXIT_FAILED;
    return EXIT_OK;
}

Prepared Dispatcher::Prepare(const std::vector<std::string>& args, const GlobalOptions& options,
                             std::ostream& out, std::ostream& err) {
    Prepared result;
    const bool json = options.formatter == "json";
    if (options.version) {
        out << programName_ << " " << HADRO_VERSION << '\n';
        return result;
    }
    if (options.listCommands) {
        WriteCommandList(options, out);
        return result;
    }
    if (!options.manual.empty()) {
        out << (options.manual == "markdown" ? Manual::Reference(programName_, *root_)
                                             : Manual::ManPage(programName_, *root_));
        return result;
    }
    if (!options.completion.empty()) {
        out << Completion::Script(options.completion, programName_, *root_);
        return result;
    }

    // Words down the tree until a command, an option or the end.
    std::shared_ptr<NamespaceNode> node = root_;
    std::size_t i = 0;
    for (; i < args.size(); ++i) {
        const std::string& word = args[i];
        if (!word.empty() && word[0] == '-') break;
        auto child = node->GetNamespaceNode(word);
        if (!child) {
            std::string where = node == root_ ? programName_ : node->GetPathString(' ');
            err << "Error: Unknown command or namespace '" << Options::Shown(word) << "' in '" << where
                << "'. " << Help::ValidChoices(*node) << '\n';
            err << Help::UsageHint(programName_, node == root_ ? "" : node->GetPathString(' '));
            result.status = EXIT_REFUSED;
            return result;
        }
        node = child;
        if (node->GetType() == NODE_COMMAND) {
            ++i;
            break;
        }
    }
    std::vector<std::string> rest(args.begin() + static_cast<std::ptrdiff_t>(i), args.end());
    const bool helpAsked = options.help || std::find(rest.begin(), rest.end(), "--help") != rest.end();

    if (node->GetType() != NODE_COMMAND) {
        bool help = helpAsked || std::find(rest.begin(), rest.end(), "-h") != rest.end();
        if (help) {
            if (json) {
                out << Help::NamespaceJson(*node);
            } else {
                out << (node == root_ ? Help::ProgramUsage(programName_, *node)
                                      : Help::NamespaceText(programName_, *node));
            }
            return result;
        }
        if (!rest.empty()) {
            err << "Error: '" << (node == root_ ? programName_ : node->GetPathString(' '))
                << "' is a namespace, not a command; " << Options::Shown(rest.front())
                << " is not valid here.\n";
        }
        err << (node == root_ ? Help::ProgramUsage(programName_, *node)
                              : Help::NamespaceText(programName_, *node));
        result.status = EXIT_REFUSED;
        return result;
    }

    auto command = std::dynamic_pointer_cast<Command>(node);
    if (!command) {
        err << "Error: '" << node->GetPathString(' ') << "' cannot be run.\n";
        result.status = EXIT_REFUSED;
        return result;
    }
    auto inputSpec = command->GetInputSpec();
    if (!inputSpec) inputSpec = CallSpec::InputSpec::New();
    const std::string path = command->GetPathString(' ');

    bool shortHelp =
        !inputSpec->FindShortParameter("h") && std::find(rest.begin(), rest.end(), "-h") != rest.end();
    if (helpAsked || shortHelp) {
        auto outputSpec = command->GetOutputSpec();
        out << (json ? Help::CommandJson(path, *command, *inputSpec, outputSpec.get())
                     : Help::CommandText(programName_, path, *command, *inputSpec, outputSpec.get()));
        return result;
    }

    auto input = CallSpec::Input::New();
    std::string error;
    if (!Options::ParseCommandOptions(rest, *inputSpec, *input, error)) {
        err << "Error: " << error << '\n';
        err << Help::UsageHint(programName_, path);
        result.status = EXIT_REFUSED;
        return result;
    }
    if (!options.formatParameters.empty()) {
        // Fields chosen with --format-param must be fields of the result.
        auto outputSpec = command->GetOutputSpec();
        error = Format::CheckFields(Format::OutputParameters(options.formatParameters),
                                    outputSpec ? outputSpec->GetRootObject().get() : nullptr);
        if (!error.empty()) {
            err << "Error: " << error << '\n';
            err << Help::UsageHint(programName_, path);
            result.status = EXIT_REFUSED;
            return result;
        }
    }
    result.ready = true;
    result.invocation = Invocation{command, path, inputSpec, input};
    return result;
}

std::shared_ptr<CallSpec::Output> Dispatcher::ExecuteRaw(const Invocation& invocation) {
    auto output = CallSpec::Output::New();
    invocation.command->Execute(invocation.input, output);
    return output;
}

int Dispatcher::Execute(const Invocation& invocation, const GlobalOptions& options, std::ostream& out,
                        std::ostream& err) {
    std::string rendered;
    std::shared_ptr<CallSpec::Output> output;
    last_.reset();
    try {
        output = ExecuteRaw(invocation);
        if (const auto& root = output->GetRootObject()) {
            std::string formatter = options.formatter;
            if (formatter.empty()) formatter = invocation.command->GetDefaultOutputFormatter();
            if (!Format::IsFormatter(formatter)) formatter = "simple";
            Format::OutputParameters parameters(invocation.command->GetDefaultOutputParameters());
            for (const auto& [key, value] : options.formatParameters)
                parameters.Set(key, value);
            Format::Render(formatter, *root, parameters, rendered);
        }
    } catch (const std::exception& e) {
        err << "Error: unexpected failure in '" << invocation.path
            << "': " << Format::TerminalSafeLines(e.what()) << '\n';
        return EXIT_UNEXPECTED;
    } catch (...) {
        err << "Error: unexpected failure in '" << invocation.path << "'\n";
        return EXIT_UNEXPECTED;
    }
    out << rendered;
    std::string messages;
    // Messages often quote names from the host or text from the command line: whatever they
    // hold, they must not drive the terminal.
    for (const auto& message : output->GetErrorMessages()) {
        messages += Format::TerminalSafeLines(message);
        messages += '\n';
    }
    err << messages;
    if (keepLast_) last_ = output;
    return StatusOf(*output);
}

int Dispatcher::Run(const std::vector<std::string>& args, const GlobalOptions& options, std::ostream& out,
                    std::ostream& err) {
    Prepared prepared = Prepare(args, options, out, err);
    if (!prepared.ready) return prepared.status;
    return Execute(prepared.invocation, options, out, err);
}

}  // namespace Zorbel::AutoCli

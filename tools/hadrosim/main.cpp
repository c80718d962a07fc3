// hadrosim: controls the simulated host behind hadrocli. It resets, exports and imports the
// host state, injects faults into host-control operations and keeps the journal of calls.
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iostream>
#include <iterator>
#include <limits>
#include <memory>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include "core/section.h"
#include "core/store.h"
#include "core/text.h"
#include "generate.h"
#include "hostctl/session.h"
#include "model/faults.h"
#include "model/journal.h"
#include "zorbel/checked_output.h"

namespace {

using HostCtl::Lib::HostSession;
using HostCtl::Lib::StateFileError;

constexpr int kOk = 0;
constexpr int kUsage = 2;
constexpr int kFailed = 3;

const char* const kUsageText =
    "Usage: hadrosim [--state=PATH] COMMAND\n"
    "\n"
    "Controls the simulated host that hadrocli works on.\n"
    "\n"
    "Commands:\n"
    "  reset                          write the default host\n"
    "  export                         print the state document\n"
    "  import FILE|-                  replace the state document (checked first)\n"
    "  generate --scale N             replace the state by a large host built on the default\n"
    "                                 one: at scale 1, 256 interfaces, 64 more switches with\n"
    "                                 1,024 port groups, 16 distributed switches with 4,096\n"
    "                                 ports, 1,000 VMs, 200 rulesets, 10,000 connections,\n"
    "                                 5,000 neighbours, 2,000 routes (N from 0.01 to 16)\n"
    "  fault add OPERATION [--target NAME] [--message TEXT] [--count N]\n"
    "                                 make calls of OPERATION fail (on target NAME only,\n"
    "                                 with TEXT, N times; default: every time, with\n"
    "                                 \"Simulated failure in OPERATION\")\n"
    "  fault list                     list the faults\n"
    "  fault clear                    remove every fault\n"
    "  journal on|off                 start or stop recording host-control calls\n"
    "  journal show                   print the recorded calls\n"
    "  journal clear                  forget the recorded calls\n"
    "\n"
    "Options:\n"
    "  --state=PATH                   state file; else $HADRO_STATE; else\n"
    "                                 ${XDG_STATE_HOME:-$HOME/.local/state}/hadro/host.json\n"
    "  --help, -h                     this text\n"
    "\n"
    "Exit status: 0 done, 2 the command line was refused, 3 the state file or the imported\n"
    "document cannot be used, or the output cannot be written (a change is made all the same).\n";

// A refused command line.
struct UsageError {
    std::string message;
};

bool HasControlCharacters(const std::string& text) {
    for (unsigned char c : text) {
        if (c < 0x20 || c == 0x7f) return true;
    }
    return false;
}

// Reads "--name=value" or "--name value" at args[i]; advances i past the value.
std::optional<std::string> OptionValue(const std::vector<std::string>& args, std::size_t& i,
                                       const std::string& name) {
    const std::string& arg = args[i];
    if (arg == name) {
        if (i + 1 >= args.size()) throw UsageError{name + " needs a value"};
        return args[++i];
    }
    if (arg.compare(0, name.size() + 1, name + "=") == 0) return arg.substr(name.size() + 1);
    return std::nullopt;
}

std::uint32_t ParseCount(const std::string& text) {
    if (text.empty() || text.size() > 10 || text.find_first_not_of("0123456789") != std::string::npos) {
        throw UsageError{"--count must be a whole number from 1 to 4294967295, not '" + text + "'"};
    }
    unsigned long long value = std::stoull(text);
    if (value == 0 || value > std::numeric_limits<std::uint32_t>::max()) {
        throw UsageError{"--count must be a whole number from 1 to 4294967295, not '" + text + "'"};
    }
    return static_cast<std::uint32_t>(value);
}

double ParseScale(const std::vector<std::string>& args) {
    std::string text;
    for (std::size_t i = 0; i < args.size(); ++i) {
        if (auto value = OptionValue(args, i, "--scale")) {
            if (!text.empty()) throw UsageError{"'generate' takes --scale once"};
            text = *value;
        } else {
            throw UsageError{"'generate' takes --scale N, not '" + args[i] + "'"};
        }
    }
    if (text.empty()) throw UsageError{"'generate' needs --scale N"};
    char* end = nullptr;
    errno = 0;
    double scale = std::strtod(text.c_str(), &end);
    if (errno != 0 || end == text.c_str() || *end != '\0' || !(scale >= Hadro::Sim::kMinScale) ||
        !(scale <= Hadro::Sim::kMaxScale)) {
        throw UsageError{"--scale must be a number from 0.01 to 16, not '" + text + "'"};
    }
    return scale;
}

void ExpectArguments(const std::vector<std::string>& words, std::size_t count, const std::string& command) {
    if (words.size() != count) throw UsageError{"'" + command + "' takes no further arguments"};
}

TknCtl::Model::Fault ParseFaultAdd(const std::vector<std::string>& args) {
    TknCtl::Model::Fault fault;
    std::vector<std::string> positional;
    for (std::size_t i = 0; i < args.size(); ++i) {
        if (auto target = OptionValue(args, i, "--target")) {
            if (target->empty() || HasControlCharacters(*target)) throw UsageError{"--target needs a name"};
            fault.target = *target;
        } else if (auto message = OptionValue(args, i, "--message")) {
            if (message->empty() || HasControlCharacters(*message)) {
                throw UsageError{"--message needs a text of one line"};
            }
            fault.message = *message;
        } else if (auto count = OptionValue(args, i, "--count")) {
            fault.count = ParseCount(*count);
        } else if (args[i].size() > 1 && args[i][0] == '-') {
            throw UsageError{"unknown option '" + args[i] + "' for 'fault add'"};
        } else {
            positional.push_back(args[i]);
        }
    }
    if (positional.empty()) throw UsageError{"'fault add' needs an OPERATION"};
    if (positional.size() > 1)
        throw UsageError{"'fault add' takes one OPERATION, not '" + positional[1] + "' too"};
    fault.operation = positional[0];
    if (fault.operation.empty() || fault.operation.find_first_of(" \t") != std::string::npos ||
        HasControlCharacters(fault.operation)) {
        throw UsageError{
            "OPERATION must be an operation name such as TknCtl::Network::DnsConfigImpl::SaveConfig"};
    }
    return fault;
}

std::string ReadInput(const std::string& source) {
    std::ostringstream buffer;
    if (source == "-") {
        buffer << std::cin.rdbuf();
        if (std::cin.bad()) throw StateFileError("import from standard input: cannot read");
        return buffer.str();
    }
    std::ifstream file(source, std::ios::binary);
    if (!file) throw StateFileError("import " + source + ": cannot read: " + std::strerror(errno));
    buffer << file.rdbuf();
    if (file.bad()) throw StateFileError("import " + source + ": cannot read");
    return buffer.str();
}

int Run(const std::vector<std::string>& args) {
    std::string statePath;
    std::size_t i = 0;
    for (; i < args.size(); ++i) {
        if (args[i] == "--help" || args[i] == "-h") {
            std::cout << kUsageText;
            return kOk;
        }
        if (auto path = OptionValue(args, i, "--state")) {
            if (path->empty()) throw UsageError{"--state needs a path"};
            statePath = *path;
            continue;
        }
        if (!args[i].empty() && args[i][0] == '-') throw UsageError{"unknown option '" + args[i] + "'"};
        break;
    }
    std::vector<std::string> words(args.begin() + static_cast<std::ptrdiff_t>(i), args.end());
    for (const auto& word : words) {
        if (word == "--help" || word == "-h") {
            std::cout << kUsageText;
            return kOk;
        }
    }
    if (words.empty()) throw UsageError{"no command given"};

    // Work out what to do before the state is touched, so that a refused command line
    // leaves the state alone.
    const std::string& command = words[0];
    enum class Action { kReset, kExport, kImport, kGenerate, kFaultAdd, kFaultList, kFaultClear, kJournal };
    Action action;
    TknCtl::Model::Fault fault;
    std::string journalVerb;
    std::string importSource;
    double scale = 1;
    if (command == "reset") {
        ExpectArguments(words, 1, command);
        action = Action::kReset;
    } else if (command == "export") {
        ExpectArguments(words, 1, command);
        action = Action::kExport;
    } else if (command == "import") {
        if (words.size() != 2) throw UsageError{"'import' takes one FILE (or - for standard input)"};
        importSource = words[1];
        action = Action::kImport;
    } else if (command == "generate") {
        scale = ParseScale(std::vector<std::string>(words.begin() + 1, words.end()));
        action = Action::kGenerate;
    } else if (command == "fault") {
        if (words.size() < 2) throw UsageError{"'fault' needs add, list or clear"};
        if (words[1] == "add") {
            fault = ParseFaultAdd(std::vector<std::string>(words.begin() + 2, words.end()));
            action = Action::kFaultAdd;
        } else if (words[1] == "list" || words[1] == "clear") {
            ExpectArguments(words, 2, "fault " + words[1]);
            action = words[1] == "list" ? Action::kFaultList : Action::kFaultClear;
        } else {
            throw UsageError{"unknown 'fault' command '" + words[1] + "' (add, list, clear)"};
        }
    } else if (command == "journal") {
        if (words.size() < 2) throw UsageError{"'journal' needs on, off, show or clear"};
        journalVerb = words[1];
        if (journalVerb != "on" && journalVerb != "off" && journalVerb != "show" && journalVerb != "clear") {
            throw UsageError{"unknown 'journal' command '" + journalVerb + "' (on, off, show, clear)"};
        }
        ExpectArguments(words, 2, "journal " + journalVerb);
        action = Action::kJournal;
    } else {
        throw UsageError{"unknown command '" + command + "'"};
    }

    std::string importText;
    if (action == Action::kImport) {
        importText = ReadInput(importSource);
        // Checked before the state is even locked: a damaged document changes nothing.
        HostSession::ValidateDocument(
            importText, "import " + (importSource == "-" ? "from standard input" : importSource));
    }

    std::string path = HostCtl::Lib::ResolveStatePath(statePath);
    std::string generated;
    if (action == Action::kGenerate) generated = Hadro::Sim::GenerateHost(scale);
    bool replaces = action == Action::kReset || action == Action::kImport || action == Action::kGenerate;
    auto session = HostSession::OpenFile(
        path, replaces ? HostSession::OpenMode::kReplace : HostSession::OpenMode::kRead);
    // hadrosim checks the whole document, not only the sections it touches: it is the tool
    // that says whether a state file is sound.
    if (!replaces) TknCtl::Lib::CurrentStore().LoadAll();
    std::string output;
    using TknCtl::Lib::Read;
    using TknCtl::Lib::Write;
    using TknCtl::Model::FaultsSection;
    using TknCtl::Model::JournalSection;
    switch (action) {
        case Action::kReset:
            session->Reset();
            break;
        case Action::kExport:
            output = session->Export();
            break;
        case Action::kImport:
            session->Replace(importText, "import " + importSource);
            break;
        case Action::kGenerate:
            session->Replace(generated, "the generated host");
            break;
        case Action::kFaultAdd:
            Write<FaultsSection>().faults.push_back(fault);
            break;
        case Action::kFaultList:
            for (const auto& f : Read<FaultsSection>().faults) {
                output += f.operation + '\t' + (f.target.empty() ? "*" : f.target) + '\t' +
                          (f.count ? std::to_string(*f.count) : "unlimited") + '\t' +
                          (f.message.empty() ? "Simulated failure in " + f.operation : f.message) + '\n';
            }
            break;
        case Action::kFaultClear:
            if (!Read<FaultsSection>().faults.empty()) Write<FaultsSection>().faults.clear();
            break;
        case Action::kJournal:
            if (journalVerb == "show") {
                for (const auto& line : Read<JournalSection>().lines)
                    output += line + '\n';
            } else if (journalVerb == "clear") {
                if (!Read<JournalSection>().lines.empty()) Write<JournalSection>().lines.clear();
            } else if (Read<JournalSection>().enabled != (journalVerb == "on")) {
                Write<JournalSection>().enabled = journalVerb == "on";
            }
            break;
    }
    session->Commit();
    std::cout << output;
    return kOk;
}

int Main(int argc, char** argv) {
    try {
        return Run(std::vector<std::string>(argv + 1, argv + argc));
    } catch (const UsageError& e) {
        std::cerr << "hadrosim: " << TknCtl::Lib::Printable(e.message)
                  << "\nUsage: hadrosim [--state=PATH] COMMAND; see 'hadrosim --help'.\n";
        return kUsage;
    } catch (const StateFileError& e) {
        std::cerr << "hadrosim: " << e.what() << '\n';
    } catch (const std::exception& e) {
        std::cerr << "hadrosim: unexpected failure: " << e.what() << '\n';
    } catch (...) {
        std::cerr << "hadrosim: unexpected failure\n";
    }
    return kFailed;
}

}  // namespace

int main(int argc, char** argv) {
    Zorbel::Output::ReserveStandardDescriptors();
    std::ios::sync_with_stdio(false);
    // Never destroyed, so that std::cout can still be flushed at exit.
    auto& out = *new Zorbel::Output::CheckedOutput(STDOUT_FILENO);
    std::cout.rdbuf(&out);
    const int status = Main(argc, argv);
    // Output that could not be written (a full disk, a closed pipe) is a failure, as in the
    // core utilities; a change already committed stays.
    if (const int error = out.Finish(); error != 0) {
        std::cerr << "hadrosim: write error: " << std::strerror(error) << '\n';
        return kFailed;
    }
    return status;
}

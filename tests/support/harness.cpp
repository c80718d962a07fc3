#include "harness.h"

#include <nlohmann/json.hpp>
#include <sstream>

#include "core/section.h"
#include "model/faults.h"
#include "model/journal.h"
#include "zorbel/dispatcher.h"

namespace Hadro::Test {

namespace {

std::shared_ptr<Zorbel::AutoCli::Dispatcher> Framework() {
    static std::shared_ptr<Zorbel::AutoCli::Dispatcher> dispatcher = [] {
        auto d = Zorbel::AutoCli::Dispatcher::New("hadrocli");
        std::ostringstream err;
        d->LoadPluginDirectories({HADRO_PLUGIN_DIR}, err);
        if (!err.str().empty()) ADD_FAILURE() << err.str();
        return d;
    }();
    return dispatcher;
}

}  // namespace

std::vector<std::string> Result::Errors() const {
    std::vector<std::string> lines;
    std::istringstream in(err);
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
}

std::vector<std::string> SplitWords(const std::string& commandLine) {
    std::vector<std::string> words;
    std::string word;
    bool inWord = false;
    char quote = 0;
    for (char c : commandLine) {
        if (quote) {
            if (c == quote) {
                quote = 0;
            } else {
                word += c;
            }
        } else if (c == '\'' || c == '"') {
            quote = c;
            inWord = true;
        } else if (c == ' ') {
            if (inWord) words.push_back(word);
            word.clear();
            inWord = false;
        } else {
            word += c;
            inWord = true;
        }
    }
    if (inWord) words.push_back(word);
    return words;
}

void CommandTest::SetUp() { session_ = HostCtl::Lib::HostSession::InMemoryDefault(); }

void CommandTest::TearDown() { session_.reset(); }

void CommandTest::UseHost(const std::string& document) {
    session_.reset();
    session_ = HostCtl::Lib::HostSession::InMemory(document);
}

void CommandTest::EditHost(const std::function<void(nlohmann::json&)>& edit) {
    auto document = nlohmann::json::parse(session_->Export());
    edit(document);
    UseHost(document.dump());
}

Result CommandTest::Run(const std::string& commandLine) { return Run(SplitWords(commandLine)); }

Result CommandTest::Run(const std::vector<std::string>& args) {
    Result result;
    Zorbel::AutoCli::GlobalOptions options;
    std::vector<std::string> rest;
    std::string error;
    if (!Zorbel::AutoCli::ParseGlobalOptions(args, options, rest, error)) {
        result.status = Zorbel::AutoCli::EXIT_REFUSED;
        result.err = error + "\n";
        return result;
    }
    std::ostringstream out, err;
    result.status = Framework()->Run(rest, options, out, err);
    result.out = out.str();
    result.err = err.str();
    return result;
}

std::string CommandTest::Export() const { return session_->Export(); }

nlohmann::json CommandTest::Section(const std::string& name) const {
    auto document = nlohmann::json::parse(session_->Export());
    return document.contains(name) ? document[name] : nlohmann::json();
}

void CommandTest::AddFault(const std::string& operation, const std::string& target, const std::string& message,
                           int count) {
    TknCtl::Model::Fault fault;
    fault.operation = operation;
    fault.target = target;
    fault.message = message;
    if (count > 0) fault.count = count;
    TknCtl::Lib::Write<TknCtl::Model::FaultsSection>().faults.push_back(fault);
}

void CommandTest::StartJournal() {
    auto& journal = TknCtl::Lib::Write<TknCtl::Model::JournalSection>();
    journal.enabled = true;
    journal.lines.clear();
}

std::vector<std::string> CommandTest::Journal() const {
    return TknCtl::Lib::Read<TknCtl::Model::JournalSection>().lines;
}

std::vector<std::string> CommandTest::Journal(const std::string& prefix) const {
    std::vector<std::string> lines;
    for (const auto& line : Journal()) {
        if (line.rfind(prefix, 0) == 0) lines.push_back(line);
    }
    return lines;
}

}  // namespace Hadro::Test

#include "system/firewall_catalogue.h"

#include <dirent.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <iterator>
#include <map>
#include <nlohmann/json.hpp>
#include <sstream>

#include "hostctl/session.h"

namespace TknCtl::Linux {

extern const char kShippedFirewallRulesets[];

namespace {

using HostCtl::Lib::StateFileError;
using nlohmann::json;

// ---------------------------------------------------------------- where each value stands

// The line a value starts on, by JSON pointer ("/rulesets/0/rules/1/portBegin"), found while
// the text is parsed: an iterator counts the characters the parser has read.
class Lines : public nlohmann::json_sax<json> {
public:
    Lines(std::string_view text, const std::size_t& consumed) : text_(text), consumed_(consumed) {}

    bool null() override { return Scalar(); }
    bool boolean(bool) override { return Scalar(); }
    bool number_integer(number_integer_t) override { return Scalar(); }
    bool number_unsigned(number_unsigned_t) override { return Scalar(); }
    bool number_float(number_float_t, const string_t&) override { return Scalar(); }
    bool string(string_t&) override { return Scalar(); }
    bool binary(binary_t&) override { return Scalar(); }
    bool start_object(std::size_t) override {
        Value();
        frames_.push_back({false, 0, {}});
        return true;
    }
    bool key(string_t& key) override {
        frames_.back().key = key;
        return true;
    }
    bool end_object() override { return End(); }
    bool start_array(std::size_t) override {
        Value();
        frames_.push_back({true, 0, {}});
        return true;
    }
    bool end_array() override { return End(); }
    bool parse_error(std::size_t position, const std::string&,
                     const nlohmann::detail::exception& error) override {
        errorLine_ = LineOf(position);
        std::string what = error.what();
        // "[json.exception.parse_error.101] parse error at line 1, column 2: syntax error ..."
        auto colon = what.find(": ", what.find("column"));
        error_ = colon == std::string::npos ? what : what.substr(colon + 2);
        return false;
    }

    int Line(const std::string& pointer) const {
        auto it = lines_.find(pointer);
        return it == lines_.end() ? 1 : it->second;
    }
    int ErrorLine() const { return errorLine_; }
    const std::string& Error() const { return error_; }

private:
    struct Frame {
        bool array;
        std::size_t index;
        std::string key;
    };

    // The line of the last character read that is not blank (the parser reads one character
    // past a number).
    int LineOf(std::size_t consumed) const {
        std::size_t at = std::min(consumed, text_.size());
        while (at > 0 && std::isspace(static_cast<unsigned char>(text_[at - 1])))
            --at;
        return 1 + static_cast<int>(
                       std::count(text_.begin(), text_.begin() + static_cast<std::ptrdiff_t>(at), '\n'));
    }
    void Value() {
        std::string pointer;
        for (const auto& frame : frames_)
            pointer += "/" + (frame.array ? std::to_string(frame.index) : frame.key);
        lines_.emplace(pointer, LineOf(consumed_));
    }
    void After() {
        if (!frames_.empty() && frames_.back().array) ++frames_.back().index;
    }
    bool Scalar() {
        Value();
        After();
        return true;
    }
    bool End() {
        frames_.pop_back();
        After();
        return true;
    }

    std::string_view text_;
    const std::size_t& consumed_;
    std::vector<Frame> frames_;
    std::map<std::string, int> lines_;
    int errorLine_ = 0;
    std::string error_;
};

// Characters of a text, counted as the parser reads them.
class Counting {
public:
    using iterator_category = std::input_iterator_tag;
    using value_type = char;
    using difference_type = std::ptrdiff_t;
    using pointer = const char*;
    using reference = const char&;

    Counting(const char* at, std::size_t* count) : at_(at), count_(count) {}
    reference operator*() const { return *at_; }
    Counting& operator++() {
        ++at_;
        ++*count_;
        return *this;
    }
    Counting operator++(int) {
        Counting before = *this;
        ++*this;
        return before;
    }
    bool operator==(const Counting& other) const { return at_ == other.at_; }
    bool operator!=(const Counting& other) const { return at_ != other.at_; }

private:
    const char* at_;
    std::size_t* count_;
};

// ---------------------------------------------------------------- reading a file

class Reader {
public:
    Reader(std::string_view text, std::string origin)
        : text_(text), origin_(std::move(origin)), lines_(text_, consumed_) {}

    json Parse() {
        if (!json::sax_parse(Counting(text_.data(), &consumed_),
                             Counting(text_.data() + text_.size(), &consumed_), &lines_))
            throw StateFileError(origin_ + ": line " + std::to_string(lines_.ErrorLine()) + ": " +
                                 lines_.Error());
        return json::parse(text_);
    }

    int Line(const std::string& pointer) const { return lines_.Line(pointer); }

    [[noreturn]] void Fail(const std::string& pointer, const std::string& fault) const {
        throw StateFileError(origin_ + ": line " + std::to_string(lines_.Line(pointer)) + ": " + fault);
    }

    // The members of an object, each known: returns the object.
    const json& Object(const json& value, const std::string& pointer, const std::string& what,
                       std::initializer_list<const char*> known) const {
        if (!value.is_object()) Fail(pointer, what + " is not an object");
        for (const auto& item : value.items()) {
            const std::string& key = item.key();
            if (std::none_of(known.begin(), known.end(), [&](const char* k) { return key == k; })) {
                std::string choices;
                for (const char* k : known)
                    choices += (choices.empty() ? "" : ", ") + std::string(k);
                Fail(pointer + "/" + key, what + ": unknown member \"" + key + "\" (known: " + choices + ")");
            }
        }
        return value;
    }

private:
    std::string_view text_;
    std::string origin_;
    std::size_t consumed_ = 0;
    Lines lines_;
};

std::string Describe(const std::string& origin) {
    return origin.empty() ? "the shipped firewall rulesets" : "firewall rulesets " + origin;
}

Kernel::NftRule ReadRule(const Reader& reader, const json& value, const std::string& pointer,
                         const std::string& what) {
    reader.Object(value, pointer, what, {"direction", "protocol", "portType", "portBegin", "portEnd"});
    auto name = [&](const char* key, std::initializer_list<const char*> names,
                    const char* fallback) -> std::uint32_t {
        auto it = value.find(key);
        if (it == value.end()) {
            if (!fallback) reader.Fail(pointer, what + ": no \"" + key + "\"");
            return static_cast<std::uint32_t>(
                std::find_if(names.begin(), names.end(),
                             [&](const char* n) { return std::strcmp(n, fallback) == 0; }) -
                names.begin());
        }
        std::uint32_t code = 0;
        for (const char* n : names) {
            if (it->is_string() && *it == n) return code;
            ++code;
        }
        std::string choices;
        for (const char* n : names)
            choices += (choices.empty() ? "" : " or ") + std::string("\"") + n + "\"";
        reader.Fail(pointer + "/" + key, what + ": \"" + key + "\" is " + choices);
    };
    auto port = [&](const char* key, std::optional<std::uint32_t> fallback) -> std::uint32_t {
        auto it = value.find(key);
        if (it == value.end()) {
            if (!fallback) reader.Fail(pointer, what + ": no \"" + key + "\"");
            return *fallback;
        }
        if (!it->is_number_unsigned() || it->get<std::uint64_t>() < 1 || it->get<std::uint64_t>() > 65535)
            reader.Fail(pointer + "/" + key, what + ": \"" + key + "\" is a port from 1 to 65535");
        return it->get<std::uint32_t>();
    };
    Kernel::NftRule rule;
    rule.direction = name("direction", {"inbound", "outbound"}, nullptr);
    rule.protocol = name("protocol", {"tcp", "udp"}, nullptr);
    rule.portType = name("portType", {"src", "dst"}, "dst");
    rule.portBegin = port("portBegin", std::nullopt);
    rule.portEnd = port("portEnd", rule.portBegin);
    if (rule.portEnd < rule.portBegin)
        reader.Fail(pointer + "/portEnd", what + ": the port range ends before it begins");
    return rule;
}

std::vector<CatalogueRuleset> ReadFile(std::string_view text, const std::string& origin) {
    Reader reader(text, Describe(origin));
    json root = reader.Parse();
    reader.Object(root, "", "the file", {"rulesets"});
    if (!root.contains("rulesets") || !root["rulesets"].is_array())
        reader.Fail("", "the file has no list \"rulesets\"");
    std::vector<CatalogueRuleset> out;
    const json& list = root["rulesets"];
    for (std::size_t i = 0; i < list.size(); ++i) {
        const std::string pointer = "/rulesets/" + std::to_string(i);
        const json& value =
            reader.Object(list[i], pointer, "ruleset " + std::to_string(i + 1),
                          {"name", "description", "enabled", "allowedAll", "allowedIps", "rules"});
        CatalogueRuleset ruleset;
        ruleset.origin = origin;
        ruleset.line = reader.Line(pointer);
        auto name = value.find("name");
        if (name == value.end() || !name->is_string())
            reader.Fail(pointer, "ruleset " + std::to_string(i + 1) + " has no \"name\"");
        ruleset.name = name->get<std::string>();
        const std::string what = "ruleset '" + ruleset.name + "'";
        if (!IsRulesetName(ruleset.name)) {
            reader.Fail(pointer + "/name",
                        what +
                            ": a ruleset name is 1 to 48 letters, digits or '_', starting with "
                            "a letter, and not \"input\" or \"runtime\"");
        }
        for (const auto& before : out) {
            if (before.name == ruleset.name) reader.Fail(pointer + "/name", what + " is defined twice");
        }
        if (auto it = value.find("description"); it != value.end()) {
            if (!it->is_string()) reader.Fail(pointer + "/description", what + ": \"description\" is text");
            ruleset.description = it->get<std::string>();
        }
        for (auto [key, flag] :
             {std::pair{"enabled", &ruleset.enabled}, std::pair{"allowedAll", &ruleset.allowedAll}}) {
            if (auto it = value.find(key); it != value.end()) {
                if (!it->is_boolean())
                    reader.Fail(pointer + "/" + key, what + ": \"" + key + "\" is true or false");
                *flag = it->get<bool>();
            }
        }
        if (auto it = value.find("allowedIps"); it != value.end()) {
            if (!it->is_array()) reader.Fail(pointer + "/allowedIps", what + ": \"allowedIps\" is a list");
            for (std::size_t j = 0; j < it->size(); ++j) {
                const std::string at = pointer + "/allowedIps/" + std::to_string(j);
                const json& entry = (*it)[j];
                auto text =
                    entry.is_string() ? Kernel::CanonicalAllowed(entry.get<std::string>()) : std::nullopt;
                if (!text)
                    reader.Fail(at, what + ": an allowed entry is an IPv4 or IPv6 address or CIDR network");
                for (const auto& other : ruleset.allowedIps) {
                    if (Kernel::Overlaps(other, *text))
                        reader.Fail(at, what + ": allowed entry " + *text + " overlaps " + other);
                }
                ruleset.allowedIps.push_back(*text);
            }
        }
        auto rules = value.find("rules");
        if (rules == value.end() || !rules->is_array() || rules->empty())
            reader.Fail(pointer, what + " has no list \"rules\" with at least one rule");
        for (std::size_t j = 0; j < rules->size(); ++j) {
            ruleset.rules.push_back(ReadRule(reader, (*rules)[j], pointer + "/rules/" + std::to_string(j),
                                             what + ": rule " + std::to_string(j + 1)));
        }
        out.push_back(std::move(ruleset));
    }
    return out;
}

}  // namespace

bool IsRulesetName(const std::string& name) {
    if (name.empty() || name.size() > 48 || name == Kernel::kInputChain || name == Kernel::kRuntimeChain)
        return false;
    if (!std::isalpha(static_cast<unsigned char>(name.front()))) return false;
    return std::all_of(name.begin(), name.end(),
                       [](char c) { return std::isalnum(static_cast<unsigned char>(c)) || c == '_'; });
}

const CatalogueRuleset* FirewallCatalogue::Find(const std::string& name) const {
    for (const auto& ruleset : rulesets) {
        if (ruleset.name == name) return &ruleset;
    }
    return nullptr;
}

void FirewallCatalogue::Extend(std::string_view text, const std::string& origin) {
    for (auto& ruleset : ReadFile(text, origin)) {
        auto it = std::find_if(rulesets.begin(), rulesets.end(),
                               [&](const CatalogueRuleset& r) { return r.name == ruleset.name; });
        if (it == rulesets.end()) {
            rulesets.push_back(std::move(ruleset));
        } else if (it->origin.empty() || it->origin == origin) {
            *it = std::move(ruleset);
        } else {
            throw StateFileError(Describe(origin) + ": ruleset '" + ruleset.name + "' is defined in " +
                                 it->origin + " already");
        }
    }
}

FirewallCatalogue FirewallCatalogue::Shipped() {
    FirewallCatalogue catalogue;
    catalogue.rulesets = ReadFile(kShippedFirewallRulesets, {});
    return catalogue;
}

FirewallCatalogue FirewallCatalogue::Load(const std::string& directory) {
    FirewallCatalogue catalogue = Shipped();
    std::vector<std::string> files;
    if (DIR* dir = opendir(directory.c_str())) {
        while (const dirent* entry = readdir(dir)) {
            std::string name = entry->d_name;
            if (name.size() > 5 && name.compare(name.size() - 5, 5, ".json") == 0 && name.front() != '.')
                files.push_back(name);
        }
        closedir(dir);
    } else if (errno != ENOENT) {
        throw StateFileError("firewall rulesets " + directory + ": cannot read: " + std::strerror(errno));
    }
    std::sort(files.begin(), files.end());
    for (const auto& name : files) {
        const std::string path = directory + "/" + name;
        std::ifstream in(path, std::ios::binary);
        std::ostringstream text;
        text << in.rdbuf();
        if (!in) throw StateFileError("firewall rulesets " + path + ": cannot read");
        catalogue.Extend(text.str(), path);
    }
    return catalogue;
}

}  // namespace TknCtl::Linux

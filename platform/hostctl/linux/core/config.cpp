#include "core/config.h"

#include <fnmatch.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <sstream>

#include "core/text.h"
#include "hostctl/session.h"

namespace TknCtl::Linux {

using HostCtl::Lib::StateFileError;

namespace {

std::string_view Trim(std::string_view text) {
    const char* blanks = " \t\r";
    auto first = text.find_first_not_of(blanks);
    if (first == std::string_view::npos) return {};
    auto last = text.find_last_not_of(blanks);
    return text.substr(first, last - first + 1);
}

std::vector<std::string> Words(std::string_view text) {
    std::vector<std::string> words;
    std::istringstream in{std::string(text)};
    for (std::string word; in >> word;)
        words.push_back(word);
    return words;
}

}  // namespace

Config Config::Parse(std::string_view text, const std::string& origin) {
    Config config;
    config.origin = origin;
    config.statePath = kDefaultState;
    std::size_t number = 0;
    std::size_t start = 0;
    while (start < text.size()) {
        std::size_t end = text.find('\n', start);
        if (end == std::string_view::npos) end = text.size();
        std::string_view line = Trim(text.substr(start, end - start));
        start = end + 1;
        ++number;
        if (line.empty() || line.front() == '#') continue;
        auto fail = [&](const std::string& fault) {
            throw StateFileError("configuration " + origin + ": line " + std::to_string(number) + ": " +
                                 fault);
        };
        auto equals = line.find('=');
        if (equals == std::string_view::npos) fail("expected 'key = value'");
        std::string key(Trim(line.substr(0, equals)));
        std::string_view value = Trim(line.substr(equals + 1));
        if (key.empty()) fail("expected 'key = value'");
        if (key == "nics") {
            config.nics = Words(value);
        } else if (key == "state") {
            if (value.empty() || value.front() != '/') fail("state must be an absolute path");
            config.statePath = std::string(value);
        } else {
            fail("unknown key " + Lib::Quote(key) + " (known: nics, state)");
        }
    }
    return config;
}

Config Config::Load() {
    std::string path = kDefaultPath;
    if (const char* env = std::getenv("HADRO_LINUX_CONF"); env && *env) path = env;
    Config config;
    std::ifstream file(path, std::ios::binary);
    if (file) {
        std::ostringstream text;
        text << file.rdbuf();
        if (file.bad()) throw StateFileError("configuration " + path + ": cannot read");
        config = Parse(text.str(), path);
    } else if (errno != ENOENT) {
        throw StateFileError("configuration " + path + ": cannot read: " + std::strerror(errno));
    } else {
        config.statePath = kDefaultState;
    }
    if (const char* env = std::getenv("HADRO_LINUX_STATE"); env && *env) config.statePath = env;
    return config;
}

bool Config::NamesNic(const std::string& name) const {
    for (const auto& pattern : nics) {
        if (fnmatch(pattern.c_str(), name.c_str(), 0) == 0) return true;
    }
    return false;
}

}  // namespace TknCtl::Linux

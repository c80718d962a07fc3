// Pieces the IPsec commands share: lifetimes as text, SPIs, name tables.
#include "commands/ip/ip.h"

namespace TalvexCli::NetworkNamespace {

std::string ConvertToHrsMinsAndSecs(unsigned int seconds) {
    if (seconds == 0) return "infinite";
    std::string text;
    if (unsigned int hours = seconds / 3600; hours != 0) text += std::to_string(hours) + "h ";
    if (unsigned int minutes = seconds % 3600 / 60; minutes != 0) text += std::to_string(minutes) + "m ";
    if (unsigned int rest = seconds % 60; rest != 0) text += std::to_string(rest) + "s ";
    return text;
}

namespace Ipsec {

bool ParseSpi(const std::string& text, std::uint32_t& spi) {
    std::size_t at = 0;
    if (text.size() > 2 && text[0] == '0' && (text[1] == 'x' || text[1] == 'X')) at = 2;
    if (at == text.size()) return false;
    std::uint64_t value = 0;
    for (; at < text.size(); ++at) {
        char c = text[at];
        int digit;
        if (c >= '0' && c <= '9') {
            digit = c - '0';
        } else if (c >= 'a' && c <= 'f') {
            digit = c - 'a' + 10;
        } else if (c >= 'A' && c <= 'F') {
            digit = c - 'A' + 10;
        } else {
            return false;
        }
        value = value * 16 + static_cast<std::uint64_t>(digit);
        if (value > 0xffffffffu) return false;
    }
    spi = static_cast<std::uint32_t>(value);
    return true;
}

std::string SpiMessage(const std::string& text) {
    return "Check the input value for '--sa-spi'. Should be hex integer. Got " + text;
}

std::string TableName(const std::vector<std::string>& table, std::uint32_t value) {
    return value < table.size() ? table[value] : std::to_string(value);
}

}  // namespace Ipsec
}  // namespace TalvexCli::NetworkNamespace

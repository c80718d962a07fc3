#include "core/text.h"

namespace TknCtl::Lib {

namespace {

void AppendPrintable(std::string& out, std::string_view text, bool escapeBackslash) {
    static const char digits[] = "0123456789abcdef";
    for (unsigned char c : text) {
        if (c < 0x20 || c > 0x7e || (escapeBackslash && c == '\\')) {
            out += "\\x";
            out += digits[c >> 4];
            out += digits[c & 0xf];
        } else {
            out += static_cast<char>(c);
        }
    }
}

}  // namespace

std::string Quote(std::string_view text) {
    std::string out = "'";
    AppendPrintable(out, text, true);
    out += '\'';
    return out;
}

std::string Printable(std::string_view text) {
    std::string out;
    AppendPrintable(out, text, false);
    return out;
}

}  // namespace TknCtl::Lib

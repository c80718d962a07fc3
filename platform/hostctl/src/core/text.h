// Text helpers for messages: quoting user-given text so that a message stays one line.
#pragma once

#include <string>
#include <string_view>

namespace TknCtl::Lib {

// The text between single quotes, with control characters, backslashes and bytes above
// 0x7e written as \xNN so that the result is one printable line.
std::string Quote(std::string_view text);
// The text with control characters and bytes above 0x7e written as \xNN (no quotes).
std::string Printable(std::string_view text);

}  // namespace TknCtl::Lib

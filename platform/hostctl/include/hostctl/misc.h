// Small string helpers shared by the library and its callers.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

namespace HostCtl::Misc {

// Splits text at every character that occurs in separators and appends the pieces, in
// order, to out. Empty pieces (separators next to each other, at the start or at the end)
// are skipped.
void StringTokenize(const std::string& text, std::vector<std::string>& out, const std::string& separators);

namespace Detail {

inline void Append(std::string& out, std::string_view piece) {
    out.append(piece);
}
inline void Append(std::string& out, const std::string& piece) {
    out.append(piece);
}
inline void Append(std::string& out, const char* piece) {
    if (piece) out.append(piece);
}
inline void Append(std::string& out, char piece) {
    out.push_back(piece);
}
template <class T>
std::enable_if_t<std::is_integral_v<T> && !std::is_same_v<T, bool> && !std::is_same_v<T, char>> Append(
    std::string& out, T value) {
    out.append(std::to_string(value));
}

}  // namespace Detail

// Joins its arguments into one string: strings as they are, integers in decimal.
template <class... Pieces>
std::string StrCat(const Pieces&... pieces) {
    std::string out;
    (Detail::Append(out, pieces), ...);
    return out;
}

}  // namespace HostCtl::Misc

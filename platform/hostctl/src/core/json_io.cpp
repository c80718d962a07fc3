#include "core/json_io.h"

#include <cmath>
#include <cstdio>

#include "core/text.h"

namespace TknCtl::Json {

namespace {

std::string Number(long double value) {
    char buffer[64];
    std::snprintf(buffer, sizeof(buffer), "%.0Lf", value);
    return buffer;
}

}  // namespace

std::string In::Path() const {
    if (!parent_) return name_ ? name_ : "";
    std::string path = parent_->Path();
    if (key_) {
        path += '.';
        path += key_;
    } else {
        path += '[' + std::to_string(index_) + ']';
    }
    return path;
}

void In::Fail(const std::string& what) const {
    throw Lib::SectionFault(Path() + ": " + what);
}

void In::RangeFail(long double min, long double max) const {
    if (!value_->is_number_integer()) Fail("expected an integer");
    Fail("expected an integer from " + Number(min) + " to " + Number(max));
}

std::string In::Str() const {
    if (!value_->is_string()) Fail("expected a string");
    return value_->get<std::string>();
}

bool In::Bool() const {
    if (!value_->is_boolean()) Fail("expected true or false");
    return value_->get<bool>();
}

const Value* In::Find(const char* key) const {
    if (!value_->is_object()) Fail("expected an object");
    auto it = value_->find(key);
    if (it == value_->end()) return nullptr;
    if (hits_ < seen_.size()) seen_[hits_] = key;
    ++hits_;
    return &*it;
}

bool In::Has(const char* key) const {
    if (!value_->is_object()) Fail("expected an object");
    return value_->contains(key);
}

In In::Member(const char* key) const {
    const Value* member = Find(key);
    if (!member) Fail(std::string("missing member \"") + key + "\"");
    return In(*member, this, key, 0);
}

std::optional<In> In::OptMember(const char* key) const {
    const Value* member = Find(key);
    if (!member) return std::nullopt;
    return In(*member, this, key, 0);
}

std::string In::Str(const char* key, std::string_view fallback) const {
    auto member = OptMember(key);
    return member ? member->Str() : std::string(fallback);
}

bool In::Bool(const char* key, bool fallback) const {
    auto member = OptMember(key);
    return member ? member->Bool() : fallback;
}

std::optional<bool> In::OptBool(const char* key) const {
    auto member = OptMember(key);
    if (!member) return std::nullopt;
    return member->Bool();
}

std::optional<std::string> In::OptStr(const char* key) const {
    auto member = OptMember(key);
    if (!member) return std::nullopt;
    return member->Str();
}

std::vector<std::string> In::Strings(const char* key) const {
    std::vector<std::string> out;
    Each(key, [&](const In& element) { out.push_back(element.Str()); });
    return out;
}

void In::Done() const {
    if (!value_->is_object() || hits_ >= value_->size()) return;
    // Slow path, only when a member was not read: name the first such member.
    for (auto it = value_->begin(); it != value_->end(); ++it) {
        bool known = false;
        for (std::size_t i = 0; i < hits_ && i < seen_.size(); ++i) {
            if (it.key() == seen_[i]) known = true;
        }
        if (!known) Fail("unknown member " + Lib::Quote(it.key()));
    }
    Fail("unknown member");
}

Value Parse(std::string_view text, const char* sectionName) {
    try {
        return Value::parse(text.begin(), text.end());
    } catch (const nlohmann::json::exception& e) {
        throw Lib::SectionFault(std::string(sectionName) + ": not valid JSON: " + Lib::Printable(e.what()));
    }
}

std::string Dump(const Node& node) {
    return node.dump(-1, ' ', false, Node::error_handler_t::replace);
}

std::vector<std::uint8_t> HexBytes(const In& in) {
    std::string text = in.Str();
    if (text.size() % 2 != 0) in.Fail("expected an even number of hexadecimal digits");
    std::vector<std::uint8_t> bytes;
    bytes.reserve(text.size() / 2);
    auto digit = [&](char c) -> int {
        if (c >= '0' && c <= '9') return c - '0';
        if (c >= 'a' && c <= 'f') return c - 'a' + 10;
        if (c >= 'A' && c <= 'F') return c - 'A' + 10;
        in.Fail("expected hexadecimal digits");
    };
    for (std::size_t i = 0; i < text.size(); i += 2) {
        bytes.push_back(static_cast<std::uint8_t>(digit(text[i]) * 16 + digit(text[i + 1])));
    }
    return bytes;
}

std::string HexText(const std::vector<std::uint8_t>& bytes) {
    static const char digits[] = "0123456789abcdef";
    std::string text;
    text.reserve(bytes.size() * 2);
    for (auto b : bytes) {
        text += digits[b >> 4];
        text += digits[b & 0xf];
    }
    return text;
}

std::uint32_t NameToCode(const In& in, const char* const* names, std::size_t count) {
    std::string text = in.Str();
    std::string accepted;
    for (std::size_t i = 0; i < count; ++i) {
        if (!names[i]) continue;
        if (text == names[i]) return static_cast<std::uint32_t>(i);
        if (!accepted.empty()) accepted += ", ";
        accepted += names[i];
    }
    in.Fail("unknown value " + Lib::Quote(text) + " (expected one of: " + accepted + ")");
}

}  // namespace TknCtl::Json

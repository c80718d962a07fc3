// Reading and writing section content as JSON (internal; includes nlohmann-json).
//
// Json::In walks a parsed value with strict, path-aware checks: a wrong type, a value out
// of range or an unknown member raises a SectionFault such as
//     "pnics[2].settings.messageLevel: expected an integer from 0 to 4294967295"
// Members read with a default may be absent; the others are required. Every member of an
// object must be read (once) before Done(), so misspelt keys are refused.
#pragma once

#include <array>
#include <cstdint>
#include <limits>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "core/section.h"

namespace TknCtl::Json {

using Node = nlohmann::ordered_json;  // output, members in insertion order

// A parsed JSON value. Reading the state is what every command pays for, in proportion to
// the size of the sections it touches: this representation and its parser (Parse) are made
// for that, with objects as flat lists of members (a section's objects are small).
class Value {
public:
    enum class Kind : std::uint8_t { kNull, kBool, kInt, kUnsigned, kDouble, kString, kArray, kObject };

    Kind kind() const { return kind_; }
    bool is_object() const { return kind_ == Kind::kObject; }
    bool is_array() const { return kind_ == Kind::kArray; }
    bool is_string() const { return kind_ == Kind::kString; }
    bool is_boolean() const { return kind_ == Kind::kBool; }
    // Any integer; an unsigned one is a non-negative integer.
    bool is_number_integer() const { return kind_ == Kind::kInt || kind_ == Kind::kUnsigned; }
    bool is_number_unsigned() const { return kind_ == Kind::kUnsigned; }
    bool Boolean() const { return boolean_; }
    std::int64_t Integer() const { return integer_; }
    std::uint64_t Unsigned() const { return unsigned_; }
    double Double() const { return double_; }
    const std::string& String() const { return text_; }
    // Elements of an array, values of an object's members.
    const std::vector<Value>& Items() const { return items_; }
    // Names of an object's members, in document order (Items() holds their values).
    const std::vector<std::string>& Keys() const { return keys_; }
    std::size_t size() const { return items_.size(); }
    // The value of a member (the last one, were the name given twice), or nullptr.
    const Value* Find(std::string_view key) const;

private:
    friend class Parser;
    Kind kind_ = Kind::kNull;
    bool boolean_ = false;
    std::int64_t integer_ = 0;
    std::uint64_t unsigned_ = 0;
    double double_ = 0;
    std::string text_;
    std::vector<Value> items_;
    std::vector<std::string> keys_;
};

class In {
public:
    // The root of a section.
    In(const Value& value, const char* sectionName) : value_(&value), name_(sectionName) {}

    std::string Path() const;
    [[noreturn]] void Fail(const std::string& what) const;

    // This value.
    const Value& Raw() const { return *value_; }
    bool IsObject() const { return value_->is_object(); }
    bool IsArray() const { return value_->is_array(); }
    std::string Str() const;
    bool Bool() const;
    template <class I>
    I Int() const {
        static_assert(std::is_integral_v<I> && !std::is_same_v<I, bool>);
        if (value_->is_number_unsigned()) {
            auto v = value_->Unsigned();
            if (v <= static_cast<std::uint64_t>(std::numeric_limits<I>::max())) return static_cast<I>(v);
        } else if (value_->is_number_integer()) {
            auto v = value_->Integer();
            if constexpr (std::is_signed_v<I>) {
                if (v >= std::numeric_limits<I>::min() && v <= std::numeric_limits<I>::max())
                    return static_cast<I>(v);
            } else if (v >= 0 && static_cast<std::uint64_t>(v) <= std::numeric_limits<I>::max()) {
                return static_cast<I>(v);
            }
        }
        RangeFail(static_cast<long double>(std::numeric_limits<I>::min()),
                  static_cast<long double>(std::numeric_limits<I>::max()));
    }
    // Calls each(In) for every element of this array.
    template <class F>
    void Elements(F&& each) const {
        if (!value_->is_array()) Fail("expected an array");
        std::size_t index = 0;
        for (const auto& element : value_->Items()) {
            In child(element, this, nullptr, index++);
            each(child);
        }
    }

    // Members of this object.
    bool Has(const char* key) const;
    In Member(const char* key) const;
    std::optional<In> OptMember(const char* key) const;
    std::string Str(const char* key) const { return Member(key).Str(); }
    std::string Str(const char* key, std::string_view fallback) const;
    bool Bool(const char* key) const { return Member(key).Bool(); }
    bool Bool(const char* key, bool fallback) const;
    template <class I>
    I Int(const char* key) const {
        return Member(key).Int<I>();
    }
    template <class I>
    I Int(const char* key, I fallback) const {
        auto member = OptMember(key);
        return member ? member->Int<I>() : fallback;
    }
    template <class I>
    std::optional<I> OptInt(const char* key) const {
        auto member = OptMember(key);
        if (!member) return std::nullopt;
        return member->Int<I>();
    }
    std::optional<bool> OptBool(const char* key) const;
    std::optional<std::string> OptStr(const char* key) const;
    // An optional array of strings (absent: empty).
    std::vector<std::string> Strings(const char* key) const;
    // Calls each(In) for every element of an optional array member.
    template <class F>
    void Each(const char* key, F&& each) const {
        if (auto member = OptMember(key)) member->Elements(each);
    }
    // Refuses members that were not read.
    void Done() const;

private:
    In(const Value& value, const In* parent, const char* key, std::size_t index)
        : value_(&value), parent_(parent), key_(key), index_(index) {}
    const Value* Find(const char* key) const;
    [[noreturn]] void RangeFail(long double min, long double max) const;

    const Value* value_;
    const In* parent_ = nullptr;
    const char* name_ = nullptr;  // root only
    const char* key_ = nullptr;   // member of an object, else element of an array
    std::size_t index_ = 0;
    mutable std::size_t hits_ = 0;
    mutable std::array<const char*, 48> seen_;  // the keys read, for naming an unknown one
};

// Parses text into a value; a syntax error becomes a SectionFault naming the section.
Value Parse(std::string_view text, const char* sectionName);
// Compact text of a node; strings that are not valid UTF-8 are repaired, never refused.
std::string Dump(const Node& node);

// Hexadecimal text <-> bytes ("0a1b..."), for EEPROM and register images.
std::vector<std::uint8_t> HexBytes(const In& in);
std::string HexText(const std::vector<std::uint8_t>& bytes);

// Maps a name to its index in a table; fails with the list of accepted names.
std::uint32_t NameToCode(const In& in, const char* const* names, std::size_t count);
template <std::size_t N>
std::uint32_t NameToCode(const In& in, const char* const (&names)[N]) {
    return NameToCode(in, names, N);
}

// Reads and writes the members of a struct listed in a table of (key, member pointer).
template <class S, class V>
struct Field {
    const char* key;
    V S::*member;
};

template <class S, class V, std::size_t N>
void ReadFields(const In& in, S& out, const Field<S, V> (&fields)[N]) {
    for (const auto& field : fields)
        out.*field.member = in.Int<V>(field.key, V{});
}

template <class S, std::size_t N>
void ReadFields(const In& in, S& out, const Field<S, bool> (&fields)[N]) {
    for (const auto& field : fields)
        out.*field.member = in.Bool(field.key, false);
}

template <class S, class V, std::size_t N>
Node WriteFields(const S& value, const Field<S, V> (&fields)[N]) {
    Node node = Node::object();
    for (const auto& field : fields)
        node[field.key] = value.*field.member;
    return node;
}

// A section kind whose content is read, written and checked by three functions.
template <class T>
class JsonSection final : public Lib::SectionKind {
public:
    using LoadFn = void (*)(const In&, T&);
    using SaveFn = Node (*)(const T&);
    using CheckFn = void (*)(const T&, Lib::Checker&);

    JsonSection(const char* name, LoadFn load, SaveFn save, CheckFn check)
        : SectionKind(name), load_(load), save_(save), check_(check) {}

    std::unique_ptr<Lib::SectionData> Parse(std::string_view text) const override {
        Value value = Json::Parse(text, Name());
        auto data = std::make_unique<Lib::SectionValue<T>>();
        In in(value, Name());
        load_(in, data->value);
        return data;
    }
    std::unique_ptr<Lib::SectionData> Empty() const override {
        return std::make_unique<Lib::SectionValue<T>>();
    }
    std::string Serialize(const Lib::SectionData& data) const override {
        return Dump(save_(static_cast<const Lib::SectionValue<T>&>(data).value));
    }
    void Validate(const Lib::SectionData& data, Lib::Checker& checker) const override {
        if (check_) check_(static_cast<const Lib::SectionValue<T>&>(data).value, checker);
    }

private:
    LoadFn load_;
    SaveFn save_;
    CheckFn check_;
};

}  // namespace TknCtl::Json

// Reading and writing section content as JSON (internal; includes nlohmann-json).
//
// Json::In walks a parsed value with strict, path-aware checks: a wrong type, a value out
// of range or an unknown member raises a SectionFault such as
//     "pnics[2].settings.messageLevel: expected an integer from 0 to 4294967295"
// Members read with a default may be absent; the others are required. Every member of an
// object must be read (once) before Done(), so misspelt keys are refused.
#pragma once

#include <cstdint>
#include <deque>
#include <limits>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "core/section.h"

namespace TknCtl::Json {

using Node = nlohmann::ordered_json;  // output, members in insertion order

// A parsed JSON value. Reading the state is what every command pays for, in proportion to
// the size of the sections it touches: this representation and its parser (Parse) are made
// for that. A value is small and flat: strings and member names point into the parsed text
// (or, when they had escapes, into text the Document decoded), and the elements of an array
// or the members of an object lie side by side in memory the Document owns. A value lives
// as long as its Document and the text it was parsed from.
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
    bool Boolean() const { return kind_ == Kind::kBool && u_.boolean; }
    std::int64_t Integer() const { return is_number_integer() ? u_.integer : 0; }
    std::uint64_t Unsigned() const { return kind_ == Kind::kUnsigned ? u_.unsigned_ : 0; }
    double Double() const { return kind_ == Kind::kDouble ? u_.real : 0; }
    std::string_view String() const {
        return is_string() ? std::string_view(u_.text, size_) : std::string_view();
    }
    // Elements of an array, values of an object's members (each knows its name: Key()).
    std::span<const Value> Items() const {
        return is_array() || is_object() ? std::span<const Value>(u_.items, size_) : std::span<const Value>();
    }
    // The member name of a value inside an object; empty elsewhere.
    std::string_view Key() const { return {key_, keySize_}; }
    std::size_t size() const { return is_array() || is_object() ? size_ : 0; }
    // The value of a member (the last one, were the name given twice), or nullptr.
    const Value* Find(std::string_view key) const;

private:
    friend class Parser;
    Kind kind_ = Kind::kNull;
    std::uint32_t size_ = 0;  // of a string, an array or an object
    std::uint32_t keySize_ = 0;
    const char* key_ = nullptr;
    union {
        std::uint64_t unsigned_ = 0;
        std::int64_t integer;
        double real;
        bool boolean;
        const char* text;
        const Value* items;
    } u_;
};

// The result of Parse: the root value and the memory its parts live in.
class Document {
public:
    const Value& Root() const { return root_; }

private:
    friend class Parser;
    Value root_;
    std::vector<std::unique_ptr<Value[]>> blocks_;
    std::deque<std::string> decoded_;  // strings and names that had escapes
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
    // The members read: by position for the first 64, counted beyond.
    mutable std::uint64_t read_ = 0;
    mutable std::size_t readBeyond_ = 0;
    mutable std::size_t next_ = 0;  // where the next member read is looked for first
};

// Parses text into a document; a syntax error becomes a SectionFault naming the section. The
// document's values point into text, which must outlive it.
Document Parse(std::string_view text, const char* sectionName);
// Compact text of a node; strings that are not valid UTF-8 are repaired, never refused.
std::string Dump(const Node& node);

// Adds a member to an object without looking for one of the same name: for writers whose
// keys are fixed and distinct, where a lookup per member would cost more than the rest.
template <class V>
void Append(Node& object, const char* key, V&& value) {
    if (!object.is_object()) object = Node::object();
    std::vector<std::pair<const std::string, Node>>& members = object.get_ref<Node::object_t&>();
    members.emplace_back(std::piecewise_construct, std::forward_as_tuple(key),
                         std::forward_as_tuple(std::forward<V>(value)));
}

inline void AppendAll(Node&) {}
template <class V, class... Rest>
void AppendAll(Node& object, const char* key, V&& value, Rest&&... rest) {
    Append(object, key, std::forward<V>(value));
    AppendAll(object, std::forward<Rest>(rest)...);
}

// An object of these members, in this order: Object("name", name, "mtu", mtu). The names
// must be distinct.
template <class... Members>
Node Object(Members&&... members) {
    Node object = Node::object();
    object.get_ref<Node::object_t&>().reserve(sizeof...(Members) / 2);
    AppendAll(object, std::forward<Members>(members)...);
    return object;
}

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
        Append(node, field.key, value.*field.member);
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
        const Document document = Json::Parse(text, Name());
        auto data = std::make_unique<Lib::SectionValue<T>>();
        In in(document.Root(), Name());
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

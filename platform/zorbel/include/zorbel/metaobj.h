// Output values of commands: strings, 64-bit integers, booleans, lists and records.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

namespace Zorbel::MetaObj {

// Kinds of value. The codes of strings (2) and records (3) are the element types of lists.
enum MetaType : int {
    META_INT = 0,
    META_BOOL = 1,
    META_STRING = 2,
    META_STRUCT = 3,
    META_LIST = 4,
};

class MetaObject {
public:
    virtual ~MetaObject();
    virtual MetaType GetType() const = 0;
    // A deep copy of the value.
    virtual std::shared_ptr<MetaObject> Clone() const = 0;
};

class MetaString : public MetaObject {
public:
    static std::shared_ptr<MetaString> New();
    static std::shared_ptr<MetaString> New(std::string value);
    MetaString() = default;
    explicit MetaString(std::string value) : value_(std::move(value)) {}

    MetaType GetType() const override { return META_STRING; }
    std::shared_ptr<MetaObject> Clone() const override;
    const std::string& Get() const { return value_; }
    void Set(std::string value) { value_ = std::move(value); }

private:
    std::string value_;
};

// A signed or an unsigned 64-bit integer (counters reach 2^63 and more). Formatters print
// either as the value it is.
class MetaInt : public MetaObject {
public:
    static std::shared_ptr<MetaInt> New();
    static std::shared_ptr<MetaInt> New(long value);
    static std::shared_ptr<MetaInt> NewUnsigned(std::uint64_t value);
    MetaInt() = default;
    explicit MetaInt(std::int64_t value) : bits_(static_cast<std::uint64_t>(value)) {}

    MetaType GetType() const override { return META_INT; }
    std::shared_ptr<MetaObject> Clone() const override;
    // The value as a signed integer; an unsigned value above INT64_MAX gives INT64_MAX.
    std::int64_t Get() const {
        if (unsigned_ && bits_ > static_cast<std::uint64_t>(INT64_MAX)) return INT64_MAX;
        return static_cast<std::int64_t>(bits_);
    }
    void Set(std::int64_t value) {
        bits_ = static_cast<std::uint64_t>(value);
        unsigned_ = false;
    }
    // Whether the value was set as an unsigned one, and that value.
    bool IsUnsigned() const { return unsigned_; }
    std::uint64_t GetUnsigned() const { return bits_; }
    void SetUnsigned(std::uint64_t value) {
        bits_ = value;
        unsigned_ = true;
    }

private:
    std::uint64_t bits_ = 0;  // the value, or its two's complement when signed and negative
    bool unsigned_ = false;
};

class MetaBool : public MetaObject {
public:
    static std::shared_ptr<MetaBool> New();
    static std::shared_ptr<MetaBool> New(bool value);
    MetaBool() = default;
    explicit MetaBool(bool value) : value_(value) {}

    MetaType GetType() const override { return META_BOOL; }
    std::shared_ptr<MetaObject> Clone() const override;
    bool Get() const { return value_; }
    void Set(bool value) { value_ = value; }

private:
    bool value_ = false;
};

class MetaList;

// A named record with ordered, named fields. Setting a field that exists replaces its value
// in place; a new field goes to the end.
class MetaStruct : public MetaObject {
public:
    using Field = std::pair<std::string, std::shared_ptr<MetaObject>>;

    static std::shared_ptr<MetaStruct> New(std::string recordName);
    explicit MetaStruct(std::string recordName) : name_(std::move(recordName)) {}

    MetaType GetType() const override { return META_STRUCT; }
    std::shared_ptr<MetaObject> Clone() const override;
    const std::string& GetName() const { return name_; }

    void SetField(const std::string& field, std::shared_ptr<MetaObject> value);
    void SetField(const std::string& field, std::shared_ptr<MetaString> value);
    void SetField(const std::string& field, std::shared_ptr<MetaInt> value);
    void SetField(const std::string& field, std::shared_ptr<MetaBool> value);
    void SetField(const std::string& field, std::shared_ptr<MetaList> value);
    void SetField(const std::string& field, std::shared_ptr<MetaStruct> value);
    void SetField(const std::string& field, const char* value);
    void SetField(const std::string& field, const std::string& value);
    void SetField(const std::string& field, bool value);
    void SetField(const std::string& field, int value);
    void SetField(const std::string& field, long value);
    void SetField(const std::string& field, const std::vector<std::string>& values);
    // Other integer widths, so that unsigned and 64-bit counters need no cast: unsigned types
    // keep their values up to 2^64 - 1.
    template <typename T>
    requires(std::is_integral_v<T> && !std::is_same_v<T, bool> && !std::is_same_v<T, int> &&
             !std::is_same_v<T, long> &&
             !std::is_same_v<T, char>) void SetField(const std::string& field, T value) {
        if constexpr (std::is_unsigned_v<T>) {
            SetUnsignedField(field, static_cast<std::uint64_t>(value));
        } else {
            SetIntField(field, static_cast<std::int64_t>(value));
        }
    }

    const std::vector<Field>& GetFields() const { return fields_; }
    // Makes room for count fields (a record built field by field then grows only once).
    void Reserve(std::size_t count) { fields_.reserve(count); }
    bool HasField(const std::string& field) const;
    // The value of a field, or null when the record has no such field.
    std::shared_ptr<MetaObject> GetField(const std::string& field) const;

private:
    void SetIntField(const std::string& field, std::int64_t value);
    void SetUnsignedField(const std::string& field, std::uint64_t value);

    std::string name_;
    std::vector<Field> fields_;
    std::size_t next_ = 0;  // where SetField looks first
};

// A list of strings (element type 2) or of records (element type 3, with a prototype record
// that describes the shape of every element).
class MetaList : public MetaObject {
public:
    static std::shared_ptr<MetaList> New(MetaType elementType);
    static std::shared_ptr<MetaList> New(MetaType elementType, std::shared_ptr<MetaStruct> prototype);
    static std::shared_ptr<MetaList> New(int elementType);
    static std::shared_ptr<MetaList> New(int elementType, std::shared_ptr<MetaStruct> prototype);
    MetaList(MetaType elementType, std::shared_ptr<MetaStruct> prototype)
        : elementType_(elementType), prototype_(std::move(prototype)) {}

    MetaType GetType() const override { return META_LIST; }
    std::shared_ptr<MetaObject> Clone() const override;
    MetaType GetElementType() const { return elementType_; }
    const std::shared_ptr<MetaStruct>& GetPrototype() const { return prototype_; }

    void Add(const char* value);
    void Add(const std::string& value);
    void Add(std::shared_ptr<MetaString> value);
    void Add(std::shared_ptr<MetaStruct> value);
    void Reserve(std::size_t count) { items_.reserve(count); }

    const std::vector<std::shared_ptr<MetaObject>>& GetItems() const { return items_; }
    std::size_t Size() const { return items_.size(); }

private:
    MetaType elementType_;
    std::shared_ptr<MetaStruct> prototype_;
    std::vector<std::shared_ptr<MetaObject>> items_;
};

}  // namespace Zorbel::MetaObj

#include "zorbel/metaobj.h"

#include <cstring>
#include <stdexcept>

namespace Zorbel::MetaObj {

MetaObject::~MetaObject() = default;

std::shared_ptr<MetaString> MetaString::New() {
    return std::make_shared<MetaString>();
}
std::shared_ptr<MetaString> MetaString::New(std::string value) {
    return std::make_shared<MetaString>(std::move(value));
}
std::shared_ptr<MetaObject> MetaString::Clone() const {
    return std::make_shared<MetaString>(value_);
}

std::shared_ptr<MetaInt> MetaInt::New() {
    return std::make_shared<MetaInt>();
}
std::shared_ptr<MetaInt> MetaInt::New(long value) {
    return std::make_shared<MetaInt>(value);
}
std::shared_ptr<MetaInt> MetaInt::NewUnsigned(std::uint64_t value) {
    auto made = std::make_shared<MetaInt>();
    made->SetUnsigned(value);
    return made;
}
std::shared_ptr<MetaObject> MetaInt::Clone() const {
    return std::make_shared<MetaInt>(*this);
}

std::shared_ptr<MetaBool> MetaBool::New() {
    return std::make_shared<MetaBool>();
}
std::shared_ptr<MetaBool> MetaBool::New(bool value) {
    return std::make_shared<MetaBool>(value);
}
std::shared_ptr<MetaObject> MetaBool::Clone() const {
    return std::make_shared<MetaBool>(value_);
}

std::shared_ptr<MetaStruct> MetaStruct::New(std::string recordName) {
    return std::make_shared<MetaStruct>(std::move(recordName));
}

std::shared_ptr<MetaObject> MetaStruct::Clone() const {
    auto copy = std::make_shared<MetaStruct>(name_);
    copy->fields_.reserve(fields_.size());
    for (const auto& [field, value] : fields_) {
        copy->fields_.emplace_back(field, value ? value->Clone() : nullptr);
    }
    return copy;
}

namespace {

// Field names are short and mostly differ in length or first letter: those are checked first.
inline bool SameName(const std::string& a, const std::string& b) {
    return a.size() == b.size() &&
           (a.empty() || (a[0] == b[0] && std::memcmp(a.data(), b.data(), a.size()) == 0));
}

}  // namespace

void MetaStruct::SetField(const std::string& field, std::shared_ptr<MetaObject> value) {
    // Fields are mostly set in the order a record was laid out: the one after the field set
    // last is tried first.
    if (next_ < fields_.size() && SameName(fields_[next_].first, field)) {
        fields_[next_++].second = std::move(value);
        return;
    }
    for (std::size_t i = 0; i < fields_.size(); ++i) {
        if (SameName(fields_[i].first, field)) {
            fields_[i].second = std::move(value);
            next_ = i + 1;
            return;
        }
    }
    fields_.emplace_back(field, std::move(value));
    next_ = fields_.size();
}

void MetaStruct::SetField(const std::string& field, std::shared_ptr<MetaString> value) {
    SetField(field, std::shared_ptr<MetaObject>(std::move(value)));
}
void MetaStruct::SetField(const std::string& field, std::shared_ptr<MetaInt> value) {
    SetField(field, std::shared_ptr<MetaObject>(std::move(value)));
}
void MetaStruct::SetField(const std::string& field, std::shared_ptr<MetaBool> value) {
    SetField(field, std::shared_ptr<MetaObject>(std::move(value)));
}
void MetaStruct::SetField(const std::string& field, std::shared_ptr<MetaList> value) {
    SetField(field, std::shared_ptr<MetaObject>(std::move(value)));
}
void MetaStruct::SetField(const std::string& field, std::shared_ptr<MetaStruct> value) {
    SetField(field, std::shared_ptr<MetaObject>(std::move(value)));
}
void MetaStruct::SetField(const std::string& field, const char* value) {
    SetField(field, std::shared_ptr<MetaObject>(MetaString::New(value ? value : "")));
}
void MetaStruct::SetField(const std::string& field, const std::string& value) {
    SetField(field, std::shared_ptr<MetaObject>(MetaString::New(value)));
}
void MetaStruct::SetField(const std::string& field, bool value) {
    SetField(field, std::shared_ptr<MetaObject>(MetaBool::New(value)));
}
void MetaStruct::SetField(const std::string& field, int value) {
    SetIntField(field, value);
}
void MetaStruct::SetField(const std::string& field, long value) {
    SetIntField(field, value);
}
void MetaStruct::SetField(const std::string& field, const std::vector<std::string>& values) {
    auto list = MetaList::New(META_STRING);
    list->Reserve(values.size());
    for (const auto& value : values)
        list->Add(value);
    SetField(field, std::shared_ptr<MetaObject>(std::move(list)));
}
void MetaStruct::SetIntField(const std::string& field, std::int64_t value) {
    SetField(field, std::shared_ptr<MetaObject>(std::make_shared<MetaInt>(value)));
}
void MetaStruct::SetUnsignedField(const std::string& field, std::uint64_t value) {
    SetField(field, std::shared_ptr<MetaObject>(MetaInt::NewUnsigned(value)));
}

bool MetaStruct::HasField(const std::string& field) const {
    return GetField(field) != nullptr;
}

std::shared_ptr<MetaObject> MetaStruct::GetField(const std::string& field) const {
    for (const auto& entry : fields_) {
        if (SameName(entry.first, field)) return entry.second;
    }
    return nullptr;
}

std::shared_ptr<MetaList> MetaList::New(MetaType elementType) {
    return std::make_shared<MetaList>(elementType, nullptr);
}
std::shared_ptr<MetaList> MetaList::New(MetaType elementType, std::shared_ptr<MetaStruct> prototype) {
    return std::make_shared<MetaList>(elementType, std::move(prototype));
}
std::shared_ptr<MetaList> MetaList::New(int elementType) {
    return New(static_cast<MetaType>(elementType));
}
std::shared_ptr<MetaList> MetaList::New(int elementType, std::shared_ptr<MetaStruct> prototype) {
    return New(static_cast<MetaType>(elementType), std::move(prototype));
}

std::shared_ptr<MetaObject> MetaList::Clone() const {
    auto copy = std::make_shared<MetaList>(
        elementType_, prototype_ ? std::static_pointer_cast<MetaStruct>(prototype_->Clone()) : nullptr);
    copy->items_.reserve(items_.size());
    for (const auto& item : items_)
        copy->items_.push_back(item ? item->Clone() : nullptr);
    return copy;
}

void MetaList::Add(const char* value) {
    Add(MetaString::New(value ? value : ""));
}
void MetaList::Add(const std::string& value) {
    Add(MetaString::New(value));
}

void MetaList::Add(std::shared_ptr<MetaString> value) {
    if (elementType_ != META_STRING) throw std::invalid_argument("a string added to a list of records");
    items_.push_back(std::move(value));
}

void MetaList::Add(std::shared_ptr<MetaStruct> value) {
    if (elementType_ != META_STRUCT) throw std::invalid_argument("a record added to a list of strings");
    items_.push_back(std::move(value));
}

}  // namespace Zorbel::MetaObj

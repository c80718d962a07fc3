#include "zorbel/callspec.h"

#include <algorithm>

namespace Zorbel::CallSpec {

const char* ParameterTypeName(ParameterType type) {
    switch (type) {
        case PARAM_STRING:
            return "string";
        case PARAM_INT:
            return "integer";
        case PARAM_BOOL:
            return "boolean";
        case PARAM_FLAG:
            return "flag";
        case PARAM_STRING_LIST:
            return "string-list";
    }
    return "unknown";
}

std::shared_ptr<ParameterConstraint> ParameterConstraint::New(ParameterConstraintType type) {
    return std::make_shared<ParameterConstraint>(type);
}
std::shared_ptr<ParameterConstraint> ParameterConstraint::New(int type) {
    return New(static_cast<ParameterConstraintType>(type));
}

void ParameterConstraint::SetIntRange(long low, long high) {
    low_ = low;
    high_ = high;
}
void ParameterConstraint::AddIntEnum(long value) {
    intEnum_.push_back(value);
}
void ParameterConstraint::AddStringEnum(const std::string& value, const std::string& help) {
    stringEnum_.push_back({value, help});
}
void ParameterConstraint::SetStringRegex(const std::string& pattern) {
    regex_ = pattern;
}

std::shared_ptr<ParameterSpec> ParameterSpec::New(const std::string& name, ParameterType type) {
    return std::make_shared<ParameterSpec>(name, type);
}
std::shared_ptr<ParameterSpec> ParameterSpec::New(const std::string& name, int type) {
    return New(name, static_cast<ParameterType>(type));
}

void ParameterSpec::SetShortName(const char* shortName) {
    shortName_ = shortName ? shortName : "";
}
void ParameterSpec::SetShortName(const std::string& shortName) {
    shortName_ = shortName;
}
void ParameterSpec::SetShortName(char shortName) {
    shortName_ = std::string(1, shortName);
}
void ParameterSpec::SetDescription(const char* description) {
    description_ = description ? description : "";
}
void ParameterSpec::SetDescription(std::string description) {
    description_ = std::move(description);
}

bool ParameterSpec::SameAs(const ParameterSpec& other) const {
    if (name_ != other.name_ || type_ != other.type_ || shortName_ != other.shortName_ ||
        description_ != other.description_ || required_ != other.required_)
        return false;
    if (!constraint_ || !other.constraint_) return !constraint_ && !other.constraint_;
    return *constraint_ == *other.constraint_;
}

std::shared_ptr<InputSpec> InputSpec::New() {
    return std::make_shared<InputSpec>();
}

void InputSpec::AddParameter(std::shared_ptr<ParameterSpec> parameter) {
    if (parameter) parameters_.push_back(std::move(parameter));
}

std::shared_ptr<ParameterSpec> InputSpec::FindParameter(const std::string& name) const {
    auto it = std::find_if(parameters_.begin(), parameters_.end(),
                           [&](const auto& p) { return p->GetName() == name; });
    return it == parameters_.end() ? nullptr : *it;
}

std::shared_ptr<ParameterSpec> InputSpec::FindShortParameter(const std::string& shortName) const {
    if (shortName.empty()) return nullptr;
    auto it = std::find_if(parameters_.begin(), parameters_.end(),
                           [&](const auto& p) { return p->GetShortName() == shortName; });
    return it == parameters_.end() ? nullptr : *it;
}

std::shared_ptr<OutputSpec> OutputSpec::New() {
    return std::make_shared<OutputSpec>();
}

std::shared_ptr<Input> Input::New() {
    return std::make_shared<Input>();
}

bool Input::HasParameter(const std::string& name) const {
    return values_.count(name) != 0;
}

const std::string& Input::GetParameter(const std::string& name) const {
    static const std::string empty;
    auto it = values_.find(name);
    return it == values_.end() ? empty : it->second.text;
}

std::int64_t Input::GetParameterInt(const std::string& name) const {
    auto it = values_.find(name);
    return it == values_.end() ? 0 : it->second.intValue;
}

bool Input::GetParameterBool(const std::string& name) const {
    auto it = values_.find(name);
    return it != values_.end() && it->second.boolValue;
}

void Input::GetParameterList(const std::string& name, std::vector<std::string>& out) const {
    auto it = values_.find(name);
    if (it == values_.end()) return;
    if (!it->second.list.empty()) {
        out.insert(out.end(), it->second.list.begin(), it->second.list.end());
    } else {
        out.push_back(it->second.text);
    }
}

bool Input::IsFlagSet(const std::string& name) const {
    auto it = values_.find(name);
    return it != values_.end() && it->second.boolValue;
}

void Input::SetString(const std::string& name, std::string text) {
    values_[name].text = std::move(text);
}

void Input::SetInt(const std::string& name, std::string text, std::int64_t value) {
    auto& v = values_[name];
    v.text = std::move(text);
    v.intValue = value;
}

void Input::SetBool(const std::string& name, std::string text, bool value) {
    auto& v = values_[name];
    v.text = std::move(text);
    v.boolValue = value;
}

void Input::SetFlag(const std::string& name) {
    auto& v = values_[name];
    v.text = "true";
    v.boolValue = true;
}

void Input::AppendListValue(const std::string& name, std::string text) {
    auto& v = values_[name];
    if (v.list.empty()) v.text = text;
    v.list.push_back(std::move(text));
}

std::shared_ptr<Output> Output::New() {
    return std::make_shared<Output>();
}

CallTarget::~CallTarget() = default;

}  // namespace Zorbel::CallSpec

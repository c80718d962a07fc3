// What a command declares (parameters and output shape) and what one invocation carries
// (the checked input and the output it fills).
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "zorbel/metaobj.h"

namespace Zorbel::CallSpec {

enum ParameterType : int {
    PARAM_STRING = 0,
    PARAM_INT = 1,
    PARAM_BOOL = 2,
    PARAM_FLAG = 3,
    PARAM_STRING_LIST = 4,
};

enum ParameterConstraintType : int {
    CONSTRAINT_NONE = 0,
    CONSTRAINT_INT_RANGE = 1,
    CONSTRAINT_INT_ENUM = 2,
    CONSTRAINT_STRING_ENUM = 3,
    CONSTRAINT_STRING_REGEX = 4,
};

// The text a parameter type is called by in help and in messages ("string", "integer", ...).
const char* ParameterTypeName(ParameterType type);

class ParameterConstraint {
public:
    struct StringEnumValue {
        std::string value;
        std::string help;
        bool operator==(const StringEnumValue&) const = default;
    };

    static std::shared_ptr<ParameterConstraint> New(ParameterConstraintType type);
    static std::shared_ptr<ParameterConstraint> New(int type);
    explicit ParameterConstraint(ParameterConstraintType type) : type_(type) {}

    void SetIntRange(long low, long high);
    void AddIntEnum(long value);
    void AddStringEnum(const std::string& value, const std::string& help);
    void SetStringRegex(const std::string& pattern);

    ParameterConstraintType GetType() const { return type_; }
    long GetRangeLow() const { return low_; }
    long GetRangeHigh() const { return high_; }
    const std::vector<long>& GetIntEnum() const { return intEnum_; }
    const std::vector<StringEnumValue>& GetStringEnum() const { return stringEnum_; }
    const std::string& GetRegex() const { return regex_; }

    bool operator==(const ParameterConstraint&) const = default;

private:
    ParameterConstraintType type_;
    long low_ = 0;
    long high_ = 0;
    std::vector<long> intEnum_;
    std::vector<StringEnumValue> stringEnum_;
    std::string regex_;
};

class ParameterSpec {
public:
    static std::shared_ptr<ParameterSpec> New(const std::string& name, ParameterType type);
    static std::shared_ptr<ParameterSpec> New(const std::string& name, int type);
    ParameterSpec(std::string name, ParameterType type) : name_(std::move(name)), type_(type) {}

    void SetShortName(const char* shortName);
    void SetShortName(const std::string& shortName);
    void SetShortName(char shortName);
    void SetDescription(const char* description);
    void SetDescription(std::string description);
    void SetRequired(bool required) { required_ = required; }
    void SetConstraint(std::shared_ptr<ParameterConstraint> constraint) {
        constraint_ = std::move(constraint);
    }

    const std::string& GetName() const { return name_; }
    ParameterType GetType() const { return type_; }
    const std::string& GetShortName() const { return shortName_; }
    const std::string& GetDescription() const { return description_; }
    bool IsRequired() const { return required_; }
    const std::shared_ptr<ParameterConstraint>& GetConstraint() const { return constraint_; }

    // Same declaration (name, type, short name, description, required flag, constraint).
    bool SameAs(const ParameterSpec& other) const;

private:
    std::string name_;
    ParameterType type_;
    std::string shortName_;
    std::string description_;
    bool required_ = false;
    std::shared_ptr<ParameterConstraint> constraint_;
};

class InputSpec {
public:
    static std::shared_ptr<InputSpec> New();

    void AddParameter(std::shared_ptr<ParameterSpec> parameter);
    const std::vector<std::shared_ptr<ParameterSpec>>& GetParameters() const { return parameters_; }
    // The parameter with this long name, or null.
    std::shared_ptr<ParameterSpec> FindParameter(const std::string& name) const;
    // The parameter with this one-letter short name, or null.
    std::shared_ptr<ParameterSpec> FindShortParameter(const std::string& shortName) const;

private:
    std::vector<std::shared_ptr<ParameterSpec>> parameters_;
};

class OutputSpec {
public:
    static std::shared_ptr<OutputSpec> New();

    void SetRootObject(std::shared_ptr<MetaObj::MetaObject> root) { root_ = std::move(root); }
    const std::shared_ptr<MetaObj::MetaObject>& GetRootObject() const { return root_; }

private:
    std::shared_ptr<MetaObj::MetaObject> root_;
};

// The parameters of one invocation, checked against the command's InputSpec.
class Input {
public:
    static std::shared_ptr<Input> New();

    bool HasParameter(const std::string& name) const;
    // The value as given on the command line; an empty string when absent.
    const std::string& GetParameter(const std::string& name) const;
    // 0 when absent.
    std::int64_t GetParameterInt(const std::string& name) const;
    // false when absent.
    bool GetParameterBool(const std::string& name) const;
    // Appends every value of a string list (or the one value of another parameter) to out.
    void GetParameterList(const std::string& name, std::vector<std::string>& out) const;
    bool IsFlagSet(const std::string& name) const;

    // Filled by the command-line parser.
    void SetString(const std::string& name, std::string text);
    void SetInt(const std::string& name, std::string text, std::int64_t value);
    void SetBool(const std::string& name, std::string text, bool value);
    void SetFlag(const std::string& name);
    void AppendListValue(const std::string& name, std::string text);

private:
    struct Value {
        std::string text;
        std::int64_t intValue = 0;
        bool boolValue = false;
        std::vector<std::string> list;
    };
    std::map<std::string, Value> values_;
};

// What one invocation produced: an optional root object and error messages, in order.
class Output {
public:
    static std::shared_ptr<Output> New();

    void SetRootObject(std::shared_ptr<MetaObj::MetaObject> root) { root_ = std::move(root); }
    void AddErrorMessage(const std::string& message) { errors_.push_back(message); }
    void AddErrorMessage(const char* message) { errors_.emplace_back(message ? message : ""); }
    bool HasError() const { return !errors_.empty(); }

    const std::shared_ptr<MetaObj::MetaObject>& GetRootObject() const { return root_; }
    const std::vector<std::string>& GetErrorMessages() const { return errors_; }

private:
    std::shared_ptr<MetaObj::MetaObject> root_;
    std::vector<std::string> errors_;
};

// Something that can be run with an input and an output.
class CallTarget {
public:
    virtual ~CallTarget();
    virtual void Execute(std::shared_ptr<Input> input, std::shared_ptr<Output> output) = 0;
};

}  // namespace Zorbel::CallSpec

#include "frame/command.h"

namespace TalvexCli::NetworkNamespace::Frame {

using namespace Zorbel;

const char* const kDefaultNetstack = "defaultTcpipStack";

void Describe(AutoCli::Command& command, const Description& description) {
    command.SetDescription(description.description);
    if (description.type) command.SetMetaDataField("type", description.type);
    if (description.formatter) command.SetDefaultOutputFormatter(description.formatter);
    for (const auto& [key, value] : description.outputParameters)
        command.SetDefaultOutputParameter(key, value);
}

Constraint Range(long low, long high) {
    Constraint c;
    c.kind = CallSpec::CONSTRAINT_INT_RANGE;
    c.low = low;
    c.high = high;
    return c;
}

Constraint IntEnum(std::initializer_list<long> values) {
    Constraint c;
    c.kind = CallSpec::CONSTRAINT_INT_ENUM;
    c.ints = values;
    return c;
}

Constraint StringEnum(std::vector<std::pair<std::string, std::string>> values) {
    Constraint c;
    c.kind = CallSpec::CONSTRAINT_STRING_ENUM;
    c.strings = std::move(values);
    return c;
}

Constraint Regex(std::string pattern) {
    Constraint c;
    c.kind = CallSpec::CONSTRAINT_STRING_REGEX;
    c.regex = std::move(pattern);
    return c;
}

std::shared_ptr<CallSpec::ParameterSpec> MakeParameter(const Param& param) {
    auto spec = CallSpec::ParameterSpec::New(param.name, static_cast<CallSpec::ParameterType>(param.type));
    spec->SetShortName(param.shortName);
    spec->SetDescription(param.description);
    if (param.constraint.kind != CallSpec::CONSTRAINT_NONE) {
        auto constraint = CallSpec::ParameterConstraint::New(param.constraint.kind);
        switch (param.constraint.kind) {
            case CallSpec::CONSTRAINT_INT_RANGE:
                constraint->SetIntRange(param.constraint.low, param.constraint.high);
                break;
            case CallSpec::CONSTRAINT_INT_ENUM:
                for (long value : param.constraint.ints)
                    constraint->AddIntEnum(value);
                break;
            case CallSpec::CONSTRAINT_STRING_ENUM:
                for (const auto& [value, help] : param.constraint.strings)
                    constraint->AddStringEnum(value, help);
                break;
            case CallSpec::CONSTRAINT_STRING_REGEX:
                constraint->SetStringRegex(param.constraint.regex);
                break;
            default:
                break;
        }
        spec->SetConstraint(constraint);
    }
    spec->SetRequired(param.required == kRequired);
    return spec;
}

InputSpecPtr MakeInputSpec(const std::vector<Param>& params) {
    auto spec = CallSpec::InputSpec::New();
    for (const auto& param : params)
        spec->AddParameter(MakeParameter(param));
    return spec;
}

std::string Netstack(const CallSpec::Input& input, const char* name) {
    const std::string& value = input.GetParameter(name);
    return value.empty() ? std::string(kDefaultNetstack) : value;
}

namespace {
OutputSpecPtr WithRoot(std::shared_ptr<MetaObj::MetaObject> root) {
    auto spec = CallSpec::OutputSpec::New();
    spec->SetRootObject(std::move(root));
    return spec;
}
}  // namespace

OutputSpecPtr BoolOutput() {
    return WithRoot(MetaObj::MetaBool::New());
}
OutputSpecPtr IntOutput() {
    return WithRoot(MetaObj::MetaInt::New());
}
OutputSpecPtr StringOutput() {
    return WithRoot(MetaObj::MetaString::New());
}
OutputSpecPtr RecordOutput(RecordPtr record) {
    return WithRoot(std::move(record));
}
OutputSpecPtr ListOutput(RecordPtr prototype) {
    return WithRoot(MakeList(std::move(prototype)));
}

namespace {

// The empty scalar values: one of each, shared by every field that starts with it. A scalar
// field is only ever replaced by SetField, never changed in place. They live as long as the
// process, and their handles own nothing: copying one costs no reference counting.
template <typename Value>
std::shared_ptr<MetaObj::MetaObject> Shared() {
    static const Value* const value = new Value();
    return std::shared_ptr<MetaObj::MetaObject>(std::shared_ptr<void>(), const_cast<Value*>(value));
}
const std::shared_ptr<MetaObj::MetaObject>& EmptyString() {
    static const auto empty = Shared<MetaObj::MetaString>();
    return empty;
}
const std::shared_ptr<MetaObj::MetaObject>& EmptyInt() {
    static const auto empty = Shared<MetaObj::MetaInt>();
    return empty;
}
const std::shared_ptr<MetaObj::MetaObject>& EmptyBool() {
    static const auto empty = Shared<MetaObj::MetaBool>();
    return empty;
}

}  // namespace

Field StringField(std::string name) {
    return {std::move(name), EmptyString()};
}
Field IntField(std::string name) {
    return {std::move(name), EmptyInt()};
}
Field BoolField(std::string name) {
    return {std::move(name), EmptyBool()};
}
Field StringListField(std::string name) {
    return {std::move(name), MetaObj::MetaList::New(MetaObj::META_STRING)};
}
Field RecordField(std::string name, RecordPtr prototype) {
    return {std::move(name), std::move(prototype)};
}
Field RecordListField(std::string name, RecordPtr prototype) {
    return {std::move(name), MakeList(std::move(prototype))};
}

namespace {

// Records and lists, which commands fill in place, are copied for each record: a field list
// or prototype serves many records. Scalars are replaced, never changed: they are shared.
std::shared_ptr<MetaObj::MetaObject> EmptyOfItsOwn(const std::shared_ptr<MetaObj::MetaObject>& empty) {
    const auto type = empty->GetType();
    return type == MetaObj::META_STRUCT || type == MetaObj::META_LIST ? empty->Clone() : empty;
}

}  // namespace

RecordPtr MakeRecord(const std::string& recordName, const std::vector<Field>& fields) {
    auto record = MetaObj::MetaStruct::New(recordName);
    record->Reserve(fields.size());
    for (const auto& field : fields)
        record->SetField(field.name, EmptyOfItsOwn(field.empty));
    return record;
}

RecordPtr RecordMaker::New() const {
    // A copy of the prototype, its records and lists then made its own.
    auto record = std::make_shared<MetaObj::MetaStruct>(*prototype_);
    for (const auto& [name, empty] : prototype_->GetFields()) {
        const auto type = empty->GetType();
        if (type == MetaObj::META_STRUCT || type == MetaObj::META_LIST)
            record->SetField(name, empty->Clone());
    }
    return record;
}

ListPtr MakeList(RecordPtr prototype) {
    return MetaObj::MetaList::New(MetaObj::META_STRUCT, std::move(prototype));
}

void SetResult(const OutputPtr& output, bool value) {
    output->SetRootObject(MetaObj::MetaBool::New(value));
}

void Fail(const std::string& message) {
    throw HostCtl::Lib::HostCtlException(message);
}

}  // namespace TalvexCli::NetworkNamespace::Frame

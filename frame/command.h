// What every command of the "network" namespace shares: the members each command class
// declares, the declaration of its parameters and output, results, and the reporting of
// host-control failures.
#pragma once

#include <initializer_list>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "hostctl/exception.h"
#include "zorbel/autocli.h"

// The members every command class declares: New(), the constructor, the destructor and the
// three per-command operations. Use it first in the class body:
//
//   class IpInterfaceList : public virtual Zorbel::AutoCli::Command {
//       NETWORK_COMMAND(IpInterfaceList)
//   public:
//       virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
//   };
#define NETWORK_COMMAND(Class)                                                       \
public:                                                                              \
    static std::shared_ptr<Class> New() {                                            \
        return std::make_shared<Class>();                                            \
    }                                                                                \
    Class();                                                                         \
    ~Class() override = default;                                                     \
    std::shared_ptr<Zorbel::CallSpec::InputSpec> GetInputSpecInternal() override;    \
    std::shared_ptr<Zorbel::CallSpec::OutputSpec> GetOutputSpecInternal() override;  \
    void ExecuteInternal(std::shared_ptr<Zorbel::CallSpec::Input> input,             \
                         std::shared_ptr<Zorbel::CallSpec::Output> output) override; \
                                                                                     \
private:

namespace TalvexCli::NetworkNamespace {

using InputPtr = std::shared_ptr<Zorbel::CallSpec::Input>;
using OutputPtr = std::shared_ptr<Zorbel::CallSpec::Output>;
using InputSpecPtr = std::shared_ptr<Zorbel::CallSpec::InputSpec>;
using OutputSpecPtr = std::shared_ptr<Zorbel::CallSpec::OutputSpec>;
using RecordPtr = std::shared_ptr<Zorbel::MetaObj::MetaStruct>;
using ListPtr = std::shared_ptr<Zorbel::MetaObj::MetaList>;

namespace Frame {

// The netstack instance a command works on when "netstack" is absent or empty.
extern const char* const kDefaultNetstack;

// ---------------------------------------------------------------- command description

// What a command's constructor tells the framework, in this order: description, metadata
// "type" (when not null), default formatter (when not null), default output parameters.
struct Description {
    const char* description;
    const char* type = nullptr;
    const char* formatter = nullptr;
    std::vector<std::pair<std::string, std::string>> outputParameters = {};
};
void Describe(Zorbel::AutoCli::Command& command, const Description& description);

// ---------------------------------------------------------------- parameters

enum ParamType : int { kString = 0, kInt = 1, kBool = 2, kFlag = 3, kStringList = 4 };
enum Required : bool { kOptional = false, kRequired = true };

// A parameter constraint; kind 0 is none.
struct Constraint {
    int kind = 0;
    long low = 0;
    long high = 0;
    std::vector<long> ints = {};
    std::vector<std::pair<std::string, std::string>> strings = {};
    std::string regex = {};
};
Constraint Range(long low, long high);
Constraint IntEnum(std::initializer_list<long> values);
// Values with their help texts (a text may be empty).
Constraint StringEnum(std::vector<std::pair<std::string, std::string>> values);
Constraint Regex(std::string pattern);

struct Param {
    std::string name;
    std::string shortName;
    ParamType type;
    std::string description;
    Required required = kOptional;
    Constraint constraint = {};
};

// The InputSpec: for each parameter in order, New(name, type), then
// SetShortName, SetDescription, SetConstraint (when constrained), SetRequired, AddParameter.
std::shared_ptr<Zorbel::CallSpec::ParameterSpec> MakeParameter(const Param& param);
InputSpecPtr MakeInputSpec(const std::vector<Param>& params);

// The value of an optional "netstack" parameter, or the default netstack.
std::string Netstack(const Zorbel::CallSpec::Input& input, const char* name = "netstack");

// ---------------------------------------------------------------- output

// Output specifications of the five root kinds.
OutputSpecPtr BoolOutput();
OutputSpecPtr IntOutput();
OutputSpecPtr StringOutput();
OutputSpecPtr RecordOutput(RecordPtr record);
OutputSpecPtr ListOutput(RecordPtr prototype);

// A field of a record prototype: its name and an empty value of its type.
struct Field {
    std::string name;
    std::shared_ptr<Zorbel::MetaObj::MetaObject> empty;
};
Field StringField(std::string name);
Field IntField(std::string name);
Field BoolField(std::string name);
Field StringListField(std::string name);
Field RecordField(std::string name, RecordPtr prototype);
Field RecordListField(std::string name, RecordPtr prototype);

// A new record with every field present once, empty, in order.
RecordPtr MakeRecord(const std::string& recordName, const std::vector<Field>& fields);
// A new empty list of records of that prototype.
ListPtr MakeList(RecordPtr prototype);

// Makes the records of a long listing: the shape (a command's GetOutputStructure) is built
// once, and each New() record is what MakeRecord would give for it.
class RecordMaker {
public:
    explicit RecordMaker(RecordPtr prototype) : prototype_(std::move(prototype)) {}
    RecordPtr New() const;

private:
    RecordPtr prototype_;
};

// Sets the boolean root value.
void SetResult(const OutputPtr& output, bool value);

// ---------------------------------------------------------------- host-control failures

// Runs step; a HostCtlException it throws becomes one error message: prefix followed by the
// exception's text. Returns whether step completed. No other exception is caught.
template <typename Step>
bool HostCall(const OutputPtr& output, const std::string& prefix, Step&& step) {
    try {
        step();
        return true;
    } catch (const HostCtl::Lib::HostCtlException& e) {
        output->AddErrorMessage(prefix + e.what());
        return false;
    }
}

// The plain form: the message is the exception's text alone.
template <typename Step>
bool HostCall(const OutputPtr& output, Step&& step) {
    return HostCall(output, std::string(), std::forward<Step>(step));
}

// Leaves a nested step with a message of the command's own, reported by the enclosing HostCall.
[[noreturn]] void Fail(const std::string& message);

}  // namespace Frame
}  // namespace TalvexCli::NetworkNamespace

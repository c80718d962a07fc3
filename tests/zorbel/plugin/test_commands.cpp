// A plug-in of small commands that exercise the framework: every parameter type and
// constraint, every kind of result, errors and escaping exceptions.
#include <stdexcept>

#include "zorbel/autocli.h"

namespace {

using namespace Zorbel;
using AutoCli::Command;
using CallSpec::Input;
using CallSpec::InputSpec;
using CallSpec::Output;
using CallSpec::OutputSpec;
using CallSpec::ParameterConstraint;
using CallSpec::ParameterSpec;
using MetaObj::MetaBool;
using MetaObj::MetaInt;
using MetaObj::MetaList;
using MetaObj::MetaString;
using MetaObj::MetaStruct;

std::shared_ptr<ParameterSpec> Param(const std::shared_ptr<InputSpec>& spec, const char* name, int type,
                                     const char* shortName, const char* description, bool required = false,
                                     std::shared_ptr<ParameterConstraint> constraint = nullptr) {
    auto p = ParameterSpec::New(name, type);
    p->SetShortName(shortName);
    p->SetDescription(description);
    if (constraint) p->SetConstraint(constraint);
    p->SetRequired(required);
    spec->AddParameter(p);
    return p;
}

std::shared_ptr<OutputSpec> Root(std::shared_ptr<MetaObj::MetaObject> root) {
    auto spec = OutputSpec::New();
    spec->SetRootObject(std::move(root));
    return spec;
}

// Echoes every parameter it was given as one record.
class TestTypesShow : public virtual Command {
public:
    static std::shared_ptr<TestTypesShow> New() { return std::make_shared<TestTypesShow>(); }
    TestTypesShow() {
        SetDescription("Show the parsed value of every parameter.");
        SetMetaDataField("type", "fetcher");
        SetDefaultOutputFormatter("simple");
    }
    std::shared_ptr<InputSpec> GetInputSpecInternal() override {
        auto spec = InputSpec::New();
        Param(spec, "name", 0, "n", "A name.");
        auto range = ParameterConstraint::New(1);
        range->SetIntRange(1, 10);
        Param(spec, "count", 1, "c", "A count.", false, range);
        auto levels = ParameterConstraint::New(2);
        for (long v : {1, 2, 3})
            levels->AddIntEnum(v);
        Param(spec, "level", 1, "l", "Level : %ENUM%", false, levels);
        auto colors = ParameterConstraint::New(3);
        colors->AddStringEnum("red", "The colour red");
        colors->AddStringEnum("blue", "");
        Param(spec, "color", 0, "C", "Colour. Available colours are %FULLENUM%", false, colors);
        auto pattern = ParameterConstraint::New(4);
        pattern->SetStringRegex("tkn([0-9]|[1-9][0-9]|1[0-9][0-9]|2[0-4][0-9]|25[0-5])");
        Param(spec, "interface", 0, "i", "An interface name.", false, pattern);
        Param(spec, "enabled", 2, "e", "Enabled or not.");
        Param(spec, "all", 3, "a", "All of them.");
        Param(spec, "item", 4, "I", "An item; may be repeated.");
        Param(spec, "offset", 1, "o", "Any integer.");
        return spec;
    }
    std::shared_ptr<OutputSpec> GetOutputSpecInternal() override { return Root(GetOutputStructure()); }
    std::shared_ptr<MetaStruct> GetOutputStructure() {
        auto record = MetaStruct::New("Parsed");
        for (const char* field :
             {"name", "count", "level", "color", "interface", "enabled", "all", "offset"}) {
            record->SetField(field, MetaString::New());
        }
        record->SetField("item", MetaList::New(2));
        return record;
    }
    void ExecuteInternal(std::shared_ptr<Input> input, std::shared_ptr<Output> output) override {
        auto record = GetOutputStructure();
        for (const char* field : {"name", "color", "interface"}) {
            record->SetField(field, input->HasParameter(field) ? input->GetParameter(field) : "<absent>");
        }
        for (const char* field : {"count", "level", "offset"}) {
            record->SetField(field, input->HasParameter(field) ? std::to_string(input->GetParameterInt(field))
                                                               : std::string("<absent>"));
        }
        record->SetField("enabled", input->HasParameter("enabled")
                                        ? std::string(input->GetParameterBool("enabled") ? "true" : "false")
                                        : std::string("<absent>"));
        record->SetField("all", input->IsFlagSet("all") ? "set" : "unset");
        std::vector<std::string> items;
        input->GetParameterList("item", items);
        record->SetField("item", items);
        output->SetRootObject(record);
    }
};

class TestRequiredSet : public virtual Command {
public:
    static std::shared_ptr<TestRequiredSet> New() { return std::make_shared<TestRequiredSet>(); }
    TestRequiredSet() {
        SetDescription("Needs a name.");
        SetMetaDataField("type", "operation");
    }
    std::shared_ptr<InputSpec> GetInputSpecInternal() override {
        auto spec = InputSpec::New();
        Param(spec, "name", 0, "n", "The name.", true);
        Param(spec, "value", 1, "v", "The value.");
        return spec;
    }
    std::shared_ptr<OutputSpec> GetOutputSpecInternal() override { return Root(MetaBool::New()); }
    void ExecuteInternal(std::shared_ptr<Input> input, std::shared_ptr<Output> output) override {
        if (input->GetParameter("name") == "bad") {
            output->AddErrorMessage("Unable to find the thing named bad");
            return;
        }
        if (input->GetParameter("name") == "twice") {
            output->AddErrorMessage("first problem");
            output->AddErrorMessage("second problem");
            output->SetRootObject(MetaBool::New(true));
            return;
        }
        output->SetRootObject(MetaBool::New(input->GetParameter("name") != "no"));
    }
};

// One record with scalars, a list of strings, a nested record and a nested list of records.
std::shared_ptr<MetaStruct> Host(const std::string& name, long mtu) {
    auto record = MetaStruct::New("Host");
    record->SetField("Name", name);
    record->SetField("MTU", mtu);
    record->SetField("Enabled", mtu > 1500);
    record->SetField("Servers", std::vector<std::string>{"10.0.0.1", "10.0.0.2"});
    auto nested = MetaStruct::New("Link");
    nested->SetField("Speed", 1000);
    nested->SetField("Duplex", "Full");
    record->SetField("Link", nested);
    auto ports = MetaList::New(3, MetaStruct::New("Port"));
    for (int i = 1; i <= 2; ++i) {
        auto port = MetaStruct::New("Port");
        port->SetField("Id", i);
        port->SetField("State", "up");
        ports->Add(port);
    }
    record->SetField("Ports", ports);
    record->SetField("Timeout", 30);
    return record;
}

class TestRecordGet : public virtual Command {
public:
    static std::shared_ptr<TestRecordGet> New() { return std::make_shared<TestRecordGet>(); }
    TestRecordGet() {
        SetDescription("One record.");
        SetMetaDataField("type", "fetcher");
        SetDefaultOutputFormatter("simple");
        SetDefaultOutputParameter("units:Host.Timeout", "sec");
        SetDefaultOutputParameter("header:Port", "<NONE>");
    }
    std::shared_ptr<InputSpec> GetInputSpecInternal() override { return InputSpec::New(); }
    std::shared_ptr<OutputSpec> GetOutputSpecInternal() override { return Root(Host("", 0)); }
    void ExecuteInternal(std::shared_ptr<Input>, std::shared_ptr<Output> output) override {
        output->SetRootObject(Host("alpha", 9000));
    }
};

class TestRecordList : public virtual Command {
public:
    static std::shared_ptr<TestRecordList> New() { return std::make_shared<TestRecordList>(); }
    TestRecordList() {
        SetDescription("A list of records.");
        SetMetaDataField("type", "fetcher");
        SetDefaultOutputFormatter("simple");
        SetDefaultOutputParameter("header:Host", "%Name%");
        SetDefaultOutputParameter("fields:Host", "Name,MTU,Missing,Enabled,Servers");
        SetDefaultOutputParameter("fields:Nothing", "Anything");
        SetDefaultOutputParameter("units:Host.MTU", "bytes");
    }
    std::shared_ptr<InputSpec> GetInputSpecInternal() override {
        auto spec = InputSpec::New();
        Param(spec, "count", 1, "c", "How many records.");
        return spec;
    }
    std::shared_ptr<OutputSpec> GetOutputSpecInternal() override {
        return Root(MetaList::New(3, Host("", 0)));
    }
    void ExecuteInternal(std::shared_ptr<Input> input, std::shared_ptr<Output> output) override {
        auto list = MetaList::New(3, Host("", 0));
        long count = input->HasParameter("count") ? input->GetParameterInt("count") : 2;
        const char* names[] = {"alpha", "b", "gamma-long-name"};
        for (long i = 0; i < count; ++i)
            list->Add(Host(names[i % 3], 1400 + 100 * i));
        output->SetRootObject(list);
    }
};

class TestTableList : public virtual Command {
public:
    static std::shared_ptr<TestTableList> New() { return std::make_shared<TestTableList>(); }
    TestTableList() {
        SetDescription("A table with a long last column.");
        SetMetaDataField("type", "fetcher");
        SetDefaultOutputFormatter("simple");
        SetDefaultOutputFormatter("table");
        SetDefaultOutputParameter("table-columns:Row", "Key,Text");
        SetDefaultOutputParameter("wrap-last", "true");
    }
    std::shared_ptr<InputSpec> GetInputSpecInternal() override { return InputSpec::New(); }
    std::shared_ptr<MetaStruct> Row(const std::string& key, const std::string& text) {
        auto row = MetaStruct::New("Row");
        row->SetField("Key", key);
        row->SetField("Hidden", 1);
        row->SetField("Text", text);
        return row;
    }
    std::shared_ptr<OutputSpec> GetOutputSpecInternal() override {
        return Root(MetaList::New(3, Row("", "")));
    }
    void ExecuteInternal(std::shared_ptr<Input>, std::shared_ptr<Output> output) override {
        auto list = MetaList::New(3, Row("", ""));
        list->Add(Row("short", "one two"));
        list->Add(Row("k", "the quick brown fox jumps over the lazy dog"));
        output->SetRootObject(list);
    }
};

class TestScalar : public virtual Command {
public:
    explicit TestScalar(int kind) : kind_(kind) {
        SetDescription("A scalar result.");
        SetMetaDataField("type", "fetcher");
    }
    std::shared_ptr<InputSpec> GetInputSpecInternal() override { return InputSpec::New(); }
    std::shared_ptr<OutputSpec> GetOutputSpecInternal() override { return Root(Value()); }
    std::shared_ptr<MetaObj::MetaObject> Value() {
        switch (kind_) {
            case 0:
                return MetaInt::New(-42);
            case 1:
                return MetaString::New("vSwitch0");
            case 2:
                return MetaBool::New(true);
            case 3:
                return MetaBool::New(false);
            case 4:
                return [] {
                    auto l = MetaList::New(2);
                    l->Add("a");
                    l->Add(std::string("b\"c"));
                    return l;
                }();
            default:
                return MetaString::New("tab\there \x1b[31m\xff end");
        }
    }
    void ExecuteInternal(std::shared_ptr<Input>, std::shared_ptr<Output> output) override {
        output->SetRootObject(Value());
    }

private:
    int kind_;
};

class TestThrow : public virtual Command {
public:
    explicit TestThrow(bool standard) : standard_(standard) { SetDescription("Throws."); }
    std::shared_ptr<InputSpec> GetInputSpecInternal() override { return InputSpec::New(); }
    std::shared_ptr<OutputSpec> GetOutputSpecInternal() override { return Root(MetaBool::New()); }
    void ExecuteInternal(std::shared_ptr<Input>, std::shared_ptr<Output> output) override {
        output->AddErrorMessage("partial");
        if (standard_) throw std::runtime_error("disk on fire");
        throw 7;
    }

private:
    bool standard_;
};

// A non-virtual base, as some command classes use.
class TestPlainSet : public Command {
public:
    static std::shared_ptr<TestPlainSet> New() { return std::make_shared<TestPlainSet>(); }
    TestPlainSet() { SetDescription("Derived without a virtual base."); }
    std::shared_ptr<InputSpec> GetInputSpecInternal() override { return InputSpec::New(); }
    std::shared_ptr<OutputSpec> GetOutputSpecInternal() override { return Root(MetaBool::New()); }
    void ExecuteInternal(std::shared_ptr<Input>, std::shared_ptr<Output> output) override {
        output->SetRootObject(MetaBool::New(true));
    }
};

}  // namespace

extern "C" void AutoCli_RegisterNamespaces(std::shared_ptr<Zorbel::AutoCli::NamespaceNode>& parent) {
    using AutoCli::Namespace;
    auto test = Namespace::New();
    test->SetDescription("Commands that exercise the framework.");
    auto types = Namespace::New();
    types->SetDescription(std::string("Parameter types."));
    types->RegisterNamespaceNode(TestTypesShow::New(), "show");
    types->RegisterNamespaceNode(TestRequiredSet::New(), std::string("set"));
    test->RegisterNamespaceNode(types, "types");
    auto record = Namespace::New();
    record->SetDescription("Records.");
    record->RegisterNamespaceNode(TestRecordGet::New(), "get");
    record->RegisterNamespaceNode(TestRecordList::New(), "list");
    record->RegisterNamespaceNode(TestTableList::New(), "table");
    test->RegisterNamespaceNode(record, "record");
    auto scalar = Namespace::New();
    scalar->SetDescription("Scalars.");
    const char* names[] = {"int", "string", "true", "false", "strings", "raw"};
    for (int i = 0; i < 6; ++i)
        scalar->RegisterNamespaceNode(std::make_shared<TestScalar>(i), names[i]);
    test->RegisterNamespaceNode(scalar, "scalar");
    auto fail = Namespace::New();
    fail->SetDescription("Failures.");
    fail->RegisterNamespaceNode(std::make_shared<TestThrow>(true), "throw");
    fail->RegisterNamespaceNode(std::make_shared<TestThrow>(false), "throw-other");
    fail->RegisterNamespaceNode(TestPlainSet::New(), "plain");
    test->RegisterNamespaceNode(fail, "fail");
    parent->RegisterNamespaceNode(test, "test");
}

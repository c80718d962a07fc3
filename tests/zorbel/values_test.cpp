#include <gtest/gtest.h>

#include <cstdint>

#include "zorbel/autocli.h"
#include "zorbel/formatter.h"
#include "zorbel/metaobj.h"

using namespace Zorbel::MetaObj;

TEST(Values, RecordFieldsKeepOrderAndReplaceInPlace) {
    auto record = MetaStruct::New("R");
    record->SetField("A", "x");
    record->SetField("B", 1);
    record->SetField("C", true);
    record->SetField("A", 5L);
    ASSERT_EQ(record->GetFields().size(), 3u);
    EXPECT_EQ(record->GetFields()[0].first, "A");
    EXPECT_EQ(record->GetFields()[0].second->GetType(), META_INT);
    EXPECT_EQ(std::static_pointer_cast<MetaInt>(record->GetField("A"))->Get(), 5);
    EXPECT_EQ(record->GetField("missing"), nullptr);

    // Integers of every width land in a 64-bit MetaInt; text never turns into a boolean.
    record->SetField("U", 4294967295u);
    record->SetField("L", static_cast<unsigned long long>(1) << 40);
    record->SetField("S", "text");
    EXPECT_EQ(std::static_pointer_cast<MetaInt>(record->GetField("U"))->Get(), 4294967295LL);
    EXPECT_EQ(std::static_pointer_cast<MetaInt>(record->GetField("L"))->Get(), 1LL << 40);
    EXPECT_EQ(record->GetField("S")->GetType(), META_STRING);
}

TEST(Values, ListsKeepTheirElementType) {
    auto strings = MetaList::New(2);
    strings->Add("a");
    strings->Add(std::string("b"));
    strings->Add(MetaString::New("c"));
    EXPECT_EQ(strings->Size(), 3u);
    EXPECT_THROW(strings->Add(MetaStruct::New("R")), std::invalid_argument);

    auto records = MetaList::New(3, MetaStruct::New("R"));
    records->Reserve(10);
    records->Add(MetaStruct::New("R"));
    EXPECT_THROW(records->Add("text"), std::invalid_argument);
    EXPECT_EQ(records->GetPrototype()->GetName(), "R");
}

TEST(Values, CloneIsDeep) {
    auto record = MetaStruct::New("R");
    auto nested = MetaStruct::New("N");
    nested->SetField("X", 1);
    record->SetField("N", nested);
    auto copy = std::static_pointer_cast<MetaStruct>(record->Clone());
    nested->SetField("X", 2);
    auto copied = std::static_pointer_cast<MetaStruct>(copy->GetField("N"));
    EXPECT_EQ(std::static_pointer_cast<MetaInt>(copied->GetField("X"))->Get(), 1);
}

namespace {
class Leaf : public virtual Zorbel::AutoCli::Command {
public:
    std::shared_ptr<Zorbel::CallSpec::InputSpec> GetInputSpecInternal() override {
        return Zorbel::CallSpec::InputSpec::New();
    }
    std::shared_ptr<Zorbel::CallSpec::OutputSpec> GetOutputSpecInternal() override {
        return Zorbel::CallSpec::OutputSpec::New();
    }
    void ExecuteInternal(std::shared_ptr<Zorbel::CallSpec::Input>,
                         std::shared_ptr<Zorbel::CallSpec::Output>) override {}
};
}  // namespace

TEST(Tree, CommandsAreLeafNodesWithPaths) {
    using namespace Zorbel::AutoCli;
    auto root = Namespace::New();
    auto network = Namespace::New();
    network->SetDescription("Network.");
    auto leaf = std::make_shared<Leaf>();
    leaf->SetDescription(std::string("A leaf."));
    network->RegisterNamespaceNode(std::shared_ptr<NamespaceNode>(leaf), "list");
    root->RegisterNamespaceNode(network, std::string("network"));

    EXPECT_EQ(leaf->GetType(), NODE_COMMAND);
    EXPECT_EQ(network->GetType(), NODE_NAMESPACE);
    EXPECT_EQ(leaf->GetThis().get(), static_cast<NamespaceNode*>(leaf.get()));
    EXPECT_EQ(leaf->GetPathString(' '), "network list");
    EXPECT_EQ(leaf->GetParent(), network);

    std::list<std::string> path{"network", "list", "--all"};
    EXPECT_EQ(root->ResolveNode(path), leaf);
    EXPECT_EQ(path, std::list<std::string>{"--all"});
    std::list<std::string> unknown{"network", "nothing"};
    EXPECT_EQ(root->ResolveNode(unknown), network);

    EXPECT_EQ(root->SubNamespace("network"), network);
    auto created = root->SubNamespace("storage");
    EXPECT_TRUE(root->HasNamespaceNode("storage"));
    EXPECT_EQ(root->GetNamespaceNodeNames(), (std::vector<std::string>{"network", "storage"}));
    (void)created;
}

TEST(Formatters, GenericTableColumnsLeaveNestedRecordsWhole) {
    // "table-columns" without a record name selects the outer record's fields; a nested record
    // whose fields it does not name shows all of its own.
    auto inner = MetaStruct::New("Inner");
    inner->SetField("Id", "7");
    inner->SetField("Up", true);
    auto items = MetaList::New(3, inner);
    items->Add(inner);
    auto outer = MetaStruct::New("Outer");
    outer->SetField("Name", "a");
    outer->SetField("Hidden", 1);
    outer->SetField("Items", items);
    auto root = MetaList::New(3, outer);
    root->Add(outer);
    Zorbel::Format::OutputParameters parameters;
    parameters.Set("table-columns", "Name,Items");
    std::string out;
    Zorbel::Format::Render("simple", *root, parameters, out);
    EXPECT_EQ(out, "Name: a\nItems:\n   Id: 7\n   Up: true\n");
    out.clear();
    Zorbel::Format::Render("table", *root, parameters, out);
    EXPECT_EQ(out, "Name  Items\n----  ---------------\na     Id: 7, Up: true\n");
}

TEST(Formatters, UnsignedIntegersPrintAsTheValuesTheyAre) {
    // Counters are unsigned 64-bit; signed values keep their sign.
    auto record = MetaStruct::New("Nic");
    record->SetField("Max", UINT64_MAX);
    record->SetField("Half", std::uint64_t{1} << 63);
    record->SetField("Min", INT64_MIN);
    auto list = MetaList::New(META_STRUCT, record);
    list->Add(record);
    const std::string max = "18446744073709551615", half = "9223372036854775808",
                      min = "-9223372036854775808";
    const std::pair<const char*, std::string> expected[] = {
        {"json", "[{\"Max\":" + max + ",\"Half\":" + half + ",\"Min\":" + min + "}]\n"},
        {"simple", "Max: " + max + "\nHalf: " + half + "\nMin: " + min + "\n"},
        {"table",
         "Max                   Half                 Min\n"
         "--------------------  -------------------  --------------------\n" +
             max + "  " + half + "  " + min + "\n"},
        {"csv", "Max,Half,Min\r\n" + max + "," + half + "," + min + "\r\n"},
        {"keyvalue", "Nic.Max=" + max + "\nNic.Half=" + half + "\nNic.Min=" + min + "\n"},
    };
    for (const auto& [formatter, text] : expected) {
        std::string out;
        Zorbel::Format::Render(formatter, *list, {}, out);
        EXPECT_EQ(out, text) << formatter;
    }
    std::string xml;
    Zorbel::Format::Render("xml", *list, {}, xml);
    EXPECT_NE(xml.find("<field name=\"Max\"><integer>" + max + "</integer></field>"), std::string::npos)
        << xml;

    // A root value; a copy stays unsigned; a signed reader gets the largest value it can hold.
    auto root = MetaInt::NewUnsigned(UINT64_MAX);
    std::string out;
    Zorbel::Format::Render("simple", *root, {}, out);
    EXPECT_EQ(out, max + "\n");
    auto copy = std::static_pointer_cast<MetaInt>(root->Clone());
    EXPECT_TRUE(copy->IsUnsigned());
    EXPECT_EQ(copy->GetUnsigned(), UINT64_MAX);
    EXPECT_EQ(copy->Get(), INT64_MAX);
    copy->Set(-1);
    EXPECT_FALSE(copy->IsUnsigned());
    EXPECT_EQ(copy->Get(), -1);
}

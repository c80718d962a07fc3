// The shared command helpers on a small command of their own.
#include <gtest/gtest.h>

#include "frame/command.h"

namespace TalvexCli::NetworkNamespace {

using namespace Frame;

class SampleThingSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(SampleThingSet)
public:
    virtual RecordPtr GetOutputStructure();
};

SampleThingSet::SampleThingSet() {
    Describe(*this, {"Set a thing.", "operation", nullptr, {{"fields:Thing", "Name,MTU"}}});
}

InputSpecPtr SampleThingSet::GetInputSpecInternal() {
    return MakeInputSpec({
        {"name", "n", kString, "The name.", kRequired},
        {"mtu", "m", kInt, "The MTU.", kOptional, Range(1280, 9000)},
        {"speed", "S", kInt, "Speed :%ENUM%", kOptional, IntEnum({10, 100})},
        {"duplex", "D", kString, "Duplex %FULLENUM%", kOptional,
         StringEnum({{"full", "Full duplex"}, {"half", ""}})},
        {"interface-name", "i", kString, "Interface.", kOptional, Regex("tkn[0-9]+")},
        {"netstack", "N", kString, "Netstack."},
    });
}

OutputSpecPtr SampleThingSet::GetOutputSpecInternal() {
    return BoolOutput();
}

RecordPtr SampleThingSet::GetOutputStructure() {
    return MakeRecord("Thing",
                      {StringField("Name"), IntField("MTU"), BoolField("Up"), StringListField("Tags"),
                       RecordField("Link", MakeRecord("Link", {IntField("Speed")}))});
}

void SampleThingSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("name");
    if (name == "own") {
        HostCall(output, "Unable to set thing. Error was : ", [&] { Fail("its own message"); });
        return;
    }
    HostCall(output, [&] {
        if (name == "bad") throw HostCtl::Lib::HostCtlException("No such thing " + name);
        if (name == "other") throw std::runtime_error("not caught here");
        SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

using namespace TalvexCli::NetworkNamespace;

namespace {
std::shared_ptr<Zorbel::CallSpec::Input> Named(const std::string& name) {
    auto input = Zorbel::CallSpec::Input::New();
    input->SetString("name", name);
    return input;
}
}  // namespace

TEST(FrameHelpers, DescriptionAndParametersInDeclarationOrder) {
    auto command = SampleThingSet::New();
    EXPECT_EQ(command->GetDescription(), "Set a thing.");
    EXPECT_EQ(command->GetMetaDataField("type"), "operation");
    EXPECT_EQ(command->GetDefaultOutputFormatter(), "");
    ASSERT_EQ(command->GetDefaultOutputParameters().size(), 1u);

    auto first = command->GetInputSpecInternal();
    auto second = command->GetInputSpecInternal();
    ASSERT_EQ(first->GetParameters().size(), 6u);
    ASSERT_EQ(second->GetParameters().size(), 6u);
    for (std::size_t i = 0; i < 6; ++i) {
        // Equal, and independent objects.
        EXPECT_TRUE(first->GetParameters()[i]->SameAs(*second->GetParameters()[i]));
        EXPECT_NE(first->GetParameters()[i], second->GetParameters()[i]);
    }
    const auto& mtu = *first->GetParameters()[1];
    EXPECT_EQ(mtu.GetShortName(), "m");
    EXPECT_FALSE(mtu.IsRequired());
    EXPECT_EQ(mtu.GetConstraint()->GetRangeHigh(), 9000);
    EXPECT_TRUE(first->GetParameters()[0]->IsRequired());
    EXPECT_EQ(first->GetParameters()[3]->GetConstraint()->GetStringEnum()[0].help, "Full duplex");
    EXPECT_EQ(first->GetParameters()[4]->GetConstraint()->GetRegex(), "tkn[0-9]+");
    EXPECT_EQ(first->GetParameters()[5]->GetConstraint(), nullptr);
}

TEST(FrameHelpers, RecordsAreFreshEachTime) {
    auto command = SampleThingSet::New();
    auto a = command->GetOutputStructure();
    auto b = command->GetOutputStructure();
    ASSERT_EQ(a->GetFields().size(), 5u);
    EXPECT_NE(a->GetField("Link"), b->GetField("Link"));
    EXPECT_EQ(a->GetField("Tags")->GetType(), Zorbel::MetaObj::META_LIST);
    auto list = Frame::ListOutput(a);
    auto root = std::static_pointer_cast<Zorbel::MetaObj::MetaList>(list->GetRootObject());
    EXPECT_EQ(root->GetElementType(), Zorbel::MetaObj::META_STRUCT);
    EXPECT_EQ(root->GetPrototype(), a);
}

TEST(FrameHelpers, RecordMakerGivesWhatMakeRecordGives) {
    using Zorbel::MetaObj::MetaList;
    using Zorbel::MetaObj::MetaStruct;
    auto command = SampleThingSet::New();
    const RecordMaker rows(command->GetOutputStructure());
    auto a = rows.New();
    auto b = rows.New();
    auto made = command->GetOutputStructure();
    ASSERT_EQ(a->GetFields().size(), made->GetFields().size());
    for (std::size_t i = 0; i < made->GetFields().size(); ++i) {
        EXPECT_EQ(a->GetFields()[i].first, made->GetFields()[i].first);
        EXPECT_EQ(a->GetFields()[i].second->GetType(), made->GetFields()[i].second->GetType());
    }
    EXPECT_EQ(a->GetName(), "Thing");
    // Records and lists are each record's own; scalars are replaced, never shared changes.
    std::static_pointer_cast<MetaList>(a->GetField("Tags"))->Add("x");
    std::static_pointer_cast<MetaStruct>(a->GetField("Link"))->SetField("Speed", 10);
    a->SetField("Name", "first");
    a->SetField("MTU", 1500);
    EXPECT_EQ(std::static_pointer_cast<MetaList>(b->GetField("Tags"))->GetItems().size(), 0u);
    EXPECT_EQ(std::static_pointer_cast<Zorbel::MetaObj::MetaInt>(
                  std::static_pointer_cast<MetaStruct>(b->GetField("Link"))->GetField("Speed"))
                  ->Get(),
              0);
    EXPECT_EQ(std::static_pointer_cast<Zorbel::MetaObj::MetaString>(b->GetField("Name"))->Get(), "");
    EXPECT_EQ(std::static_pointer_cast<Zorbel::MetaObj::MetaInt>(b->GetField("MTU"))->Get(), 0);
    EXPECT_EQ(std::static_pointer_cast<Zorbel::MetaObj::MetaString>(a->GetField("Name"))->Get(), "first");
    // Setting fields out of their order, or a new one, keeps one field per name.
    a->SetField("Up", true);
    a->SetField("Name", "again");
    a->SetField("Extra", "e");
    EXPECT_EQ(a->GetFields().size(), 6u);
    EXPECT_EQ(a->GetFields().back().first, "Extra");
    EXPECT_EQ(std::static_pointer_cast<Zorbel::MetaObj::MetaString>(a->GetField("Name"))->Get(), "again");
}

TEST(FrameHelpers, HostControlFailuresBecomeOneMessage) {
    auto command = SampleThingSet::New();
    auto output = Zorbel::CallSpec::Output::New();
    command->Execute(Named("ok"), output);
    EXPECT_FALSE(output->HasError());
    ASSERT_NE(output->GetRootObject(), nullptr);

    output = Zorbel::CallSpec::Output::New();
    command->Execute(Named("bad"), output);
    EXPECT_EQ(output->GetErrorMessages(), std::vector<std::string>{"No such thing bad"});
    EXPECT_EQ(output->GetRootObject(), nullptr);

    output = Zorbel::CallSpec::Output::New();
    command->Execute(Named("own"), output);
    EXPECT_EQ(output->GetErrorMessages(),
              std::vector<std::string>{"Unable to set thing. Error was : its own message"});
    EXPECT_EQ(output->GetRootObject(), nullptr);

    // Only the host-control exception is caught.
    output = Zorbel::CallSpec::Output::New();
    EXPECT_THROW(command->Execute(Named("other"), output), std::runtime_error);
}

TEST(FrameHelpers, NetstackDefault) {
    auto input = Zorbel::CallSpec::Input::New();
    EXPECT_EQ(Frame::Netstack(*input), "defaultTcpipStack");
    input->SetString("netstack", "");
    EXPECT_EQ(Frame::Netstack(*input), "defaultTcpipStack");
    input->SetString("netstack", "glidex");
    EXPECT_EQ(Frame::Netstack(*input), "glidex");
}

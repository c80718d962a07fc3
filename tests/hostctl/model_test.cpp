// The host model: the default host and the checks between sections.
#include <gtest/gtest.h>

#include <string>

#include "core/section.h"
#include "core/store.h"
#include "hostctl/session.h"
#include "model/dvswitches.h"
#include "model/netstacks.h"
#include "model/pnics.h"
#include "model/ports.h"
#include "model/tknnics.h"
#include "model/vswitches.h"
#include "model/worlds.h"

using HostCtl::Lib::HostSession;
using HostCtl::Lib::StateFileError;
using TknCtl::Lib::Read;
namespace Model = TknCtl::Model;

namespace {

// The default document with one text replaced by another (the text must occur).
std::string DefaultWith(const std::string& from, const std::string& to) {
    std::string text = HostSession::InMemoryDefault()->Export();
    auto at = text.find(from);
    EXPECT_NE(at, std::string::npos) << from;
    if (at != std::string::npos) text.replace(at, from.size(), to);
    return text;
}

// The fault a full check of text finds, or "".
std::string Fault(const std::string& text) {
    try {
        HostSession::ValidateDocument(text, "fixture");
    } catch (const StateFileError& e) {
        return e.what();
    }
    return "";
}

}  // namespace

TEST(DefaultHost, IsSoundAndHoldsWhatCommandsNeed) {
    EXPECT_EQ(Fault(HostSession::DefaultDocument()), "");
    auto session = HostSession::InMemoryDefault();
    const auto& pnics = Read<Model::PnicsSection>();
    ASSERT_EQ(pnics.nics.size(), 7u);
    EXPECT_FALSE(pnics.Find("vmnic4")->pci.has_value());
    EXPECT_EQ(pnics.Find("vmnic4")->description.rfind("USB-NIC:", 0), 0u);
    EXPECT_FALSE(pnics.Find("vmnic2")->linkUp);
    EXPECT_TRUE(pnics.Find("vmnic1")->settings.supportsWakeOn);
    EXPECT_FALSE(pnics.Find("vmnic0")->settings.supportsWakeOn);
    EXPECT_EQ(pnics.Find("vmnic5")->sriov.vfs.size(), 4u);
    EXPECT_TRUE(pnics.Find("vmnic6")->sriov.enabled);
    EXPECT_TRUE(pnics.Find("vmnic6")->sriov.vfs.empty());

    const auto& vswitches = Read<Model::VSwitchesSection>();
    EXPECT_EQ(vswitches.FindPortGroupSwitch("Management Network"), vswitches.Find("vSwitch0"));
    EXPECT_EQ(vswitches.FindPortGroup("Migration")->vlanId, 20);
    const auto& tknnics = Read<Model::TknNicsSection>();
    EXPECT_EQ(tknnics.Find("tkn0")->connection.portGroup, "Management Network");
    EXPECT_EQ(tknnics.Find("tkn1")->netstack, "glidex");
    EXPECT_EQ(Read<Model::NetstacksSection>().Find("PellixProvisioning")->state, Model::kNetstackConfigured);
    const auto& dvs = *Read<Model::DvSwitchesSection>().Find("dvs-prod");
    EXPECT_EQ(dvs.lacp.form, Model::kLacpMultipleLag);
    EXPECT_EQ(dvs.lacp.lags.at(0).uplinkCount, 2u);
}

TEST(DefaultHost, EveryVmPortBelongsToANamedVmWorld) {
    auto session = HostSession::InMemoryDefault();
    const auto& worlds = Read<Model::WorldsSection>();
    int vmPorts = 0;
    for (const auto& port : Read<Model::PortsSection>().ports) {
        if (port.type != Model::kPortVm) continue;
        ++vmPorts;
        const auto* world = worlds.Find(port.worldId);
        ASSERT_NE(world, nullptr) << port.id;
        EXPECT_EQ(world->name.rfind("vmm0:", 0), 0u) << world->name;
    }
    EXPECT_GE(vmPorts, 4);
}

TEST(Consistency, EverySectionIsCheckedBeforeItIsUsed) {
    // A switch with an uplink that is no NIC: the interfaces, whose checks only look the
    // switches' port groups up, can be used; the switches themselves cannot.
    const std::string dangling =
        DefaultWith(R"("uplinks":["vmnic0","vmnic1"])", R"("uplinks":["vmnic0","vmnic9"])");
    const std::string broken = DefaultWith(R"("uplinks":["vmnic0","vmnic1"])", R"("uplinks":["vmnic0",,])");
    {
        auto session = HostSession::InMemory(dangling);
        EXPECT_FALSE(Read<Model::TknNicsSection>().nics.empty());
        try {
            Read<Model::VSwitchesSection>();
            FAIL() << "a switch with an unknown uplink was used";
        } catch (const StateFileError& e) {
            EXPECT_NE(std::string(e.what()).find("uplink 'vmnic9' is not a physical NIC"), std::string::npos)
                << e.what();
        }
        EXPECT_THROW(Read<Model::VSwitchesSection>(), StateFileError);  // again: nothing half-checked stays
    }
    // Text that is not JSON is refused even where it is only looked up.
    auto session = HostSession::InMemory(broken);
    EXPECT_THROW(Read<Model::TknNicsSection>(), StateFileError);
}

TEST(Consistency, DanglingReferencesBetweenSectionsAreRefused) {
    struct Case {
        std::string from, to, fault;
    } cases[] = {
        {R"("portGroup":"Management Network")", R"("portGroup":"No Such")", "unknown port group 'No Such'"},
        {R"("netstack":"glidex","mac")", R"("netstack":"nostack","mac")", "unknown netstack 'nostack'"},
        {R"("uplinks":["vmnic0","vmnic1"])", R"("uplinks":["vmnic0","vmnic9"])",
         "uplink 'vmnic9' is not a physical NIC"},
        {R"("uplinks":["vmnic2"])", R"("uplinks":["vmnic3"])", "a NIC on two switches"},
        {R"("ownerWorldId":2110598)", R"("ownerWorldId":42)", "owned by unknown world 42"},
        {R"("interface":"tkn1","source")", R"("interface":"tkn9","source")", "unknown interface 'tkn9'"},
        {R"("switch":"vSwitch1")", R"("switch":"vSwitch7")", "unknown switch 'vSwitch7'"},
        {R"("worldId":2097905)", R"("worldId":7)", "unknown world 7"},
        {R"("name":"Migration")", R"("name":"VM Network")", "duplicate port group name 'VM Network'"},
        {R"("portId":"30","connectionId")", R"("portId":"31","connectionId")",
         "unknown distributed port '31'"},
        {R"("name":"tkn2")", R"("name":"tkn1")", "duplicate interface name 'tkn1'"},
        {R"("maxLcores":4)", R"("maxLcores":4,"lcores":[{"id":1,"affinity":5}],"x":0)", "unknown member"},
    };
    for (const auto& c : cases) {
        std::string fault = Fault(DefaultWith(c.from, c.to));
        EXPECT_NE(fault.find(c.fault), std::string::npos) << c.to << " -> " << fault;
        EXPECT_EQ(fault.rfind("fixture: ", 0), 0u) << fault;
    }
}

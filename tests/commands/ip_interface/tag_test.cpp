// "network ip interface tag ...": tags and the netstacks they are bound to.
#include "ip_interface_test.h"

namespace IpInterfaceTests {
namespace {

const char* const kSupported =
    "Supported tags are: Management, Glidex, faultToleranceLogging, PellixReplication, PellixReplicationNFC, "
    "PellixProvisioning, Storage, StorageWitness";

nlohmann::json Tags(std::initializer_list<const char*> names) {
    auto tags = nlohmann::json::array();
    for (const char* name : names)
        tags.push_back(name);
    return tags;
}

TEST_F(IpInterfaceTest, TagNamesAreCheckedAndListed) {
    EXPECT_EQ(Json("network ip interface tag add --help")["description"],
              std::string("Adds a tag on a given Tarkon network interface. ") + kSupported);
    for (const char* verb : {"add", "remove"}) {
        auto r = Run(std::string("network ip interface tag ") + verb + " -i tkn0 -t glidex");
        EXPECT_EQ(r.Errors(), (Strings{"Invalid tag name glidex", kSupported})) << verb;
        EXPECT_EQ(r.out, "");
        EXPECT_EQ(r.status, 1);
    }
}

TEST_F(IpInterfaceTest, DedicatedTagsStayWithTheirNetstack) {
    // glidex is enabled and has tkn1: its tag cannot go to another interface.
    EXPECT_EQ(Run("network ip interface tag add -i tkn0 -t Glidex").Errors(),
              Strings{"Failed to add Glidex tag when dedicated stack is instantiated"});
    // An interface of a dedicated netstack takes no other tag.
    EXPECT_EQ(Run("network ip interface tag add -i tkn1 -t Storage").Errors(),
              Strings{"netstack mismatch for tagStorage"});
    EXPECT_EQ(Json("network ip interface tag get -i tkn1")["Tags"], Tags({"Glidex"}));

    // faultTolerance does not exist yet: its tag may go to an interface of the default netstack.
    ASSERT_EQ(Run("network ip interface tag add -i tkn0 -t faultToleranceLogging").status, 0);
    EXPECT_EQ(Json("network ip interface tag get -i tkn0")["Tags"],
              Tags({"Management", "faultToleranceLogging"}));
    // Once glidex has no interfaces, its tag is free.
    ASSERT_EQ(Run("network ip interface remove -i tkn1").status, 0);
    EXPECT_EQ(Run("network ip interface tag add -i tkn0 -t Glidex").status, 0);
    // A tag the interface carries already changes nothing.
    EXPECT_EQ(Run("network ip interface tag add -i tkn0 -t Glidex").status, 0);
    EXPECT_EQ(Json("network ip interface tag get -i tkn0")["Tags"],
              Tags({"Management", "faultToleranceLogging", "Glidex"}));

    EXPECT_EQ(Run("network ip interface tag add -i tkn9 -t Storage").Errors(),
              Strings{"Unable to find tknnic with name tkn9"});
    AddFault("HostCtl::Network::TknNic::AddTag", "tkn2", "tags locked");
    EXPECT_EQ(Run("network ip interface tag add -i tkn2 -t Management").Errors(),
              Strings{"Error setting tag Management on interface tkn2. Error was : tags locked"});
}

TEST_F(IpInterfaceTest, TagsAreReadAndRemoved) {
    EXPECT_EQ(Run("network ip interface tag get -i tkn0").out, "Tags: Management\n");
    ASSERT_EQ(Run("network ip interface tag remove -i tkn0 -t Management").status, 0);
    EXPECT_EQ(Json("network ip interface tag get -i tkn0")["Tags"], nlohmann::json::array());
    // The remove command makes no netstack check; the host refuses a tag the interface lacks.
    ASSERT_EQ(Run("network ip interface tag remove -i tkn1 -t Glidex").status, 0);
    EXPECT_EQ(Run("network ip interface tag remove -i tkn1 -t Glidex").Errors(),
              Strings{"Error removing tag Glidex from interface tkn1. Error was : Tarkon network interface "
                      "tkn1 does not "
                      "carry the tag Glidex"});
    EXPECT_EQ(Run("network ip interface tag remove -i tkn9 -t Glidex").Errors(),
              Strings{"Unable to find tknnic with name tkn9"});

    EXPECT_EQ(Run("network ip interface tag get -i tkn9").Errors(),
              Strings{"Unable to find an interface with name tkn9"});
    AddFault("HostCtl::Network::TknNic::GetTags", "tkn2", "tags unreadable");
    EXPECT_EQ(Run("network ip interface tag get -i tkn2").Errors(),
              Strings{"Error getting tags on interface tkn2. Error was : tags unreadable"});
}

}  // namespace
}  // namespace IpInterfaceTests

// resolv.conf as text: what is read, and what a change keeps.
#include <gtest/gtest.h>

#include "kernel/resolv.h"

namespace {

using TknCtl::Linux::Kernel::ParseResolvConf;
using TknCtl::Linux::Kernel::UpdateResolvConf;

TEST(ResolvConf, ReadsServersInOrderAndTheLastSearchLine) {
    auto config = ParseResolvConf(
        "# comment\nnameserver 10.0.0.1\ndomain old.example\nnameserver  2001:db8::1 # trailing\n"
        "search a.example b.example\noptions rotate\nnameserver\n");
    EXPECT_EQ(config.servers, (std::vector<std::string>{"10.0.0.1", "2001:db8::1"}));
    EXPECT_EQ(config.searchDomains, (std::vector<std::string>{"a.example", "b.example"}));
}

TEST(ResolvConf, AnUpdateKeepsOtherLinesAndThePlacesOfItsOwn) {
    std::string text =
        "# managed by hand\nnameserver 10.0.0.1\noptions rotate\nnameserver 10.0.0.2\nsearch x.example\n";
    EXPECT_EQ(UpdateResolvConf(text, {{"10.0.0.2", "10.0.0.3"}, {}}),
              "# managed by hand\nnameserver 10.0.0.2\nnameserver 10.0.0.3\noptions rotate\n");
    EXPECT_EQ(UpdateResolvConf("options ndots:1", {{"10.0.0.9"}, {"y.example"}}),
              "options ndots:1\nnameserver 10.0.0.9\nsearch y.example\n");
    EXPECT_EQ(ParseResolvConf(UpdateResolvConf("", {{"::1"}, {"z.example"}})).searchDomains,
              (std::vector<std::string>{"z.example"}));
}

}  // namespace

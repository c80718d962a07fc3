// Tests of the Linux host run hadrocli --backend=linux against a host that each test builds in
// network and mount namespaces of its own, never touching the machine's network:
//
//   class RouteTest : public Hadro::Test::NamespaceHostTest {};
//   TEST_F(RouteTest, AddsARoute) {
//       Sh("ip link add a0 type veth peer name a1 && ip addr add 10.1.0.1/24 dev a0 && ip link set a0 up");
//       EXPECT_EQ(Hadro("network ip route ipv4 add -n 10.2.0.0/16 -g 10.1.0.2").status, 0);
//       auto routes = ShJson("ip -j route show 10.2.0.0/16");     // the kernel's own view
//       EXPECT_EQ(routes[0]["gateway"], "10.1.0.2");
//   }
//
// Each test process (ctest runs one test per process) enters a private mount namespace; each
// test then gets a fresh network namespace with its loopback up, its own sysfs, a tmpfs over
// /run (so /run/netns is the test's), an overlay over /etc (so /etc/netns and /etc/resolv.conf
// are the test's; the machine's /etc is never written), and a scratch directory holding the
// Linux host's configuration and document ($HADRO_LINUX_CONF, $HADRO_LINUX_STATE). Where the
// namespaces cannot be made (not root), every test is skipped with a line that says why.
#pragma once

#include <gtest/gtest.h>

#include <string>

#include <nlohmann/json.hpp>

namespace Hadro::Test {

// A file's whole content ("" when it cannot be read); whether text holds part.
std::string Slurp(const std::string& path);
inline bool Has(const std::string& text, const std::string& part) {
    return text.find(part) != std::string::npos;
}

struct HostResult {
    int status = -1;  // exit status; -1 when the program did not end by itself
    std::string out;
    std::string err;
    std::string All() const { return out + err; }
};

class NamespaceHostTest : public ::testing::Test {
protected:
    void SetUp() override;
    void TearDown() override;

    // Runs a shell command line (ip, nft, ethtool, ss, ...) in the test's namespaces. Sh fails
    // the test when the command does not exit 0; Try returns whatever happened.
    std::string Sh(const std::string& command);
    HostResult Try(const std::string& command);
    // The JSON a command prints (ip -j, nft -j, ...).
    nlohmann::json ShJson(const std::string& command);

    // hadrocli --backend=linux with the plug-in of this build; arguments are shell words.
    HostResult Hadro(const std::string& arguments);
    // The same with --formatter=json: the parsed output (the test fails when it is no JSON).
    nlohmann::json HadroJson(const std::string& arguments);
    // The same, run as an unprivileged user (nobody), for the refusals of changes.
    HostResult HadroUnprivileged(const std::string& arguments);

    // Writes the Linux host's configuration file (the default is an empty one).
    void Configure(const std::string& text);

    std::string dir_;       // scratch directory of the test, removed after it
    std::string document_;  // the Linux host's document: dir_/linux.json
};

}  // namespace Hadro::Test

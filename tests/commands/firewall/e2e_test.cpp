// The firewall commands through the real programs, on a state file of their own.
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

#include "processes.h"

namespace {

class FirewallEndToEnd : public Hadro::Test::EndToEndTest {};

TEST_F(FirewallEndToEnd, UnloadLoadAndStatus) {
    auto r = Cli("network firewall unload");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "");
    r = Cli("network firewall get");
    EXPECT_EQ(r.out, "Loaded: false\nEnabled: false\nDefaultAction: PASS\n");
    r = Cli("network firewall set --enabled false");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "Firewall module is not loaded\n");
    r = Cli("network firewall ruleset list");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "The firewall module 'hadrofw' is not loaded\n");

    EXPECT_EQ(Cli("network firewall load").status, 0);
    r = Cli("--formatter=json network firewall get");
    EXPECT_EQ(r.out, "{\"Loaded\":true,\"Enabled\":true,\"DefaultAction\":\"DROP\"}\n");
}

TEST_F(FirewallEndToEnd, AllowedAddressesPersist) {
    EXPECT_EQ(Cli("network firewall ruleset set -r sshServer --allowed-all false").status, 0);
    EXPECT_EQ(Cli("network firewall ruleset allowedip add -r sshServer -i 2001:db8::/48").status, 0);
    EXPECT_EQ(Cli("network firewall ruleset allowedip add -r sshServer -i 192.0.2.10").status, 0);
    auto r = Cli("network firewall ruleset allowedip add -r sshServer -i 192.0.2.10");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "'192.0.2.10' is already on the allowed list of ruleset 'sshServer'\n");
    r = Cli("network firewall ruleset allowedip list -r sshServer");
    EXPECT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out,
              "Ruleset    Allowed IP Addresses\n"
              "---------  -------------------------\n"
              "sshServer  192.0.2.10, 2001:db8::/48\n");
    r = Cli("network firewall ruleset allowedip add -r sshServer");
    EXPECT_EQ(r.status, 2);

    ASSERT_EQ(Sim("fault add HostCtl::System::FirewallRuleset::RemoveAllowedIp --target sshServer "
                  "--message 'allowed list is read-only' --count 1")
                  .status,
              0);
    r = Cli("network firewall ruleset allowedip remove -r sshServer -i 192.0.2.10");
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.err, "allowed list is read-only\n");
    EXPECT_EQ(Cli("network firewall ruleset allowedip remove -r sshServer -i 192.0.2.10").status, 0);
}

}  // namespace

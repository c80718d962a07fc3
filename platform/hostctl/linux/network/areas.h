// The areas of the Linux host, each made from the host's context. Each is defined in the file
// named as its twin on the simulated host (network/dns.cpp, system/firewall.cpp, ...).
#pragma once

#include <memory>

namespace TknCtl::Backend {
class Interfaces;
class Routing;
class Dns;
class Netstacks;
class Ipsec;
class Firewall;
class Nics;
class Switches;
}  // namespace TknCtl::Backend

namespace TknCtl::Linux {

class Context;

std::unique_ptr<Backend::Interfaces> MakeInterfaces(Context& context);  // network/tknnic.cpp
std::unique_ptr<Backend::Routing> MakeRouting(Context& context);        // network/routing.cpp
std::unique_ptr<Backend::Dns> MakeDns(Context& context);                // network/dns.cpp
std::unique_ptr<Backend::Netstacks> MakeNetstacks(Context& context);    // network/netstack.cpp
std::unique_ptr<Backend::Ipsec> MakeIpsec(Context& context);            // network/ipsec.cpp
std::unique_ptr<Backend::Firewall> MakeFirewall(Context& context);      // system/firewall.cpp
std::unique_ptr<Backend::Nics> MakeNics(Context& context);              // network/pnic.cpp
std::unique_ptr<Backend::Switches> MakeSwitches(Context& context);      // network/vswitch.cpp

}  // namespace TknCtl::Linux

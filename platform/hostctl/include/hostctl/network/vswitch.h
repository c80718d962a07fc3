// Standard virtual switches, their port groups and policies.
#pragma once

#include "hostctl/network/portset.h"

namespace HostCtl::Network {

class PortGroup {
public:
    virtual ~PortGroup();
};

// A standard switch.
class VirtualSwitch : public Portset {};

class NicTeamingPolicy {};
class PortSecurityPolicy {};
class ShapingPolicy {};
class NicCapabilities {};

}  // namespace HostCtl::Network

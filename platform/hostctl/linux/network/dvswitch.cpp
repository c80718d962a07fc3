// Distributed switches of the Linux host: a plain Linux host has none. (A later step may read
// those of Open vSwitch.) With none, the distributed-switch, LACP, port and VM commands give
// their own results for a host without any: empty lists and their messages.
#include "network/vswitch.h"

namespace TknCtl::Linux {

std::vector<std::string> LinuxSwitches::DistributedSwitches() {
    return {};
}

}  // namespace TknCtl::Linux

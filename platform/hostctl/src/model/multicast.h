// Section "multicast": the multicast group memberships of the Tarkon interfaces.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "core/section.h"

namespace TknCtl::Model {

struct Membership {
    std::string interface;  // a Tarkon interface
    std::string group;      // group address as text
    std::string linkLayer;  // the group's MAC address as text
    std::uint32_t refCount = 1;
};

struct MulticastSection {
    static const Lib::SectionKind& Kind();
    std::vector<Membership> memberships;
};

}  // namespace TknCtl::Model

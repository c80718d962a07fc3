// Section "worlds": the host's worlds (processes and virtual machines) that own sockets,
// ports and virtual functions.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "core/section.h"

namespace TknCtl::Model {

struct World {
    std::uint32_t id = 0;  // never 0 ("no world")
    std::string name;      // a virtual machine's world is named "vmm0:" followed by the VM name
};

struct WorldsSection {
    static const Lib::SectionKind& Kind();
    std::vector<World> worlds;

    const World* Find(std::uint32_t id) const;
};

}  // namespace TknCtl::Model

// Section "worlds": the host's worlds (processes and virtual machines) that own sockets,
// ports and virtual functions.
#pragma once

#include <cstdint>
#include <string>
#include <unordered_map>
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

    // The world of that ID (the first one, were there several), or nullptr.
    const World* Find(std::uint32_t id) const;

    // Where Find last saw each ID in worlds. Every answer is checked against worlds, so a
    // changed vector only costs a new index, never a wrong answer.
    mutable std::unordered_map<std::uint32_t, std::size_t> index;
};

}  // namespace TknCtl::Model

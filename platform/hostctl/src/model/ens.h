// Section "ens": the contexts (lcores) of the Enhanced Networking Stack.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "core/section.h"

namespace TknCtl::Model {

struct Lcore {
    std::uint64_t id = 0;
    std::string switchName = "null";  // "null": no switch
    std::uint32_t affinity = 0;       // NUMA node
};

struct EnsSection {
    static const Lib::SectionKind& Kind();
    std::uint64_t maxLcores = 4;
    std::uint32_t numaNodes = 2;  // NUMA nodes of the host; an affinity is below this
    std::vector<Lcore> lcores;    // at most maxLcores

    const Lcore* Find(std::uint64_t id) const;
    Lcore* Find(std::uint64_t id);
};

}  // namespace TknCtl::Model

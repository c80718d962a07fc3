// Section "ens": the contexts (lcores) of the Enhanced Networking Stack.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "core/section.h"

namespace TknCtl::Model {

// The highest maximum number of ENS contexts the host allows.
constexpr std::uint64_t kMaxLcoresLimit = 64;

struct Lcore {
    std::uint64_t id = 0;
    std::string switchName = "null";  // "null": no switch
    std::uint32_t affinity = 0;       // NUMA node
};

struct EnsSection {
    static const Lib::SectionKind& Kind();
    std::uint64_t maxLcores = 4;
    std::uint32_t numaNodes = 2;  // NUMA nodes of the host (at least 1); an affinity is below this
    std::vector<Lcore> lcores;    // IDs below maxLcores

    const Lcore* Find(std::uint64_t id) const;
    Lcore* Find(std::uint64_t id);
};

}  // namespace TknCtl::Model

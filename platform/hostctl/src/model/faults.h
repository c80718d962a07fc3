// Section "faults": failures injected into host-control operations (hadrosim fault add).
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "core/section.h"

namespace TknCtl::Model {

struct Fault {
    std::string operation;               // "TknCtl::Network::DnsConfigImpl::SaveConfig"
    std::string target;                  // entity name; empty: any target
    std::string message;                 // empty: "Simulated failure in OPERATION"
    std::optional<std::uint32_t> count;  // calls left to fail; absent: unlimited
};

struct FaultsSection {
    static const Lib::SectionKind& Kind();
    std::vector<Fault> faults;  // the first matching fault applies
};

}  // namespace TknCtl::Model

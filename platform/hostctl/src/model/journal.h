// Section "journal": the record of host-control calls (hadrosim journal on|off|show|clear).
#pragma once

#include <string>
#include <vector>

#include "core/section.h"

namespace TknCtl::Model {

struct JournalSection {
    static const Lib::SectionKind& Kind();
    bool enabled = false;
    std::vector<std::string> lines;  // "OPERATION TARGET ARGUMENTS", in call order
};

}  // namespace TknCtl::Model

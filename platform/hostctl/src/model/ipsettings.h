// Section "ipsettings": global IP settings of the Tarkon stacks.
#pragma once

#include "core/section.h"

namespace TknCtl::Model {

struct IpSettingsSection {
    static const Lib::SectionKind& Kind();
    bool ipv6Enabled = true;  // takes effect at once
};

}  // namespace TknCtl::Model

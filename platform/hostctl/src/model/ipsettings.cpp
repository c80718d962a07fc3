#include "model/ipsettings.h"

#include "core/json_io.h"

namespace TknCtl::Model {

namespace {

void Load(const Json::In& in, IpSettingsSection& section) {
    section.ipv6Enabled = in.Bool("ipv6Enabled", true);
    in.Done();
}

Json::Node Save(const IpSettingsSection& section) {
    return Json::Node{{"ipv6Enabled", section.ipv6Enabled}};
}

}  // namespace

const Lib::SectionKind& IpSettingsSection::Kind() {
    static const Json::JsonSection<IpSettingsSection> kind("ipsettings", Load, Save, nullptr);
    return kind;
}

}  // namespace TknCtl::Model

#include "model/multicast.h"

#include "model/tknnics.h"
#include "model/values.h"

namespace TknCtl::Model {

namespace {

void Load(const Json::In& in, MulticastSection& section) {
    in.Elements([&](const Json::In& item) {
        Membership m;
        m.interface = item.Str("interface");
        m.group = item.Str("group");
        m.linkLayer = item.Str("linkLayer", "");
        m.refCount = item.Int<std::uint32_t>("refCount", 1);
        item.Done();
        if (!IsIpAddressText(m.group)) item.Fail("invalid group address " + Lib::Quote(m.group));
        section.memberships.push_back(std::move(m));
    });
}

Json::Node Save(const MulticastSection& section) {
    Json::Node out = Json::Node::array();
    for (const auto& m : section.memberships) {
        out.push_back({{"interface", m.interface},
                       {"group", m.group},
                       {"linkLayer", m.linkLayer},
                       {"refCount", m.refCount}});
    }
    return out;
}

void Check(const MulticastSection& section, Lib::Checker& checker) {
    for (const auto& m : section.memberships) {
        if (!checker.Get<TknNicsSection>().Find(m.interface)) {
            checker.Fail("membership of unknown interface " + Lib::Quote(m.interface));
        }
    }
}

}  // namespace

const Lib::SectionKind& MulticastSection::Kind() {
    static const Json::JsonSection<MulticastSection> kind("multicast", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model

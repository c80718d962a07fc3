#include "model/ens.h"

#include "model/values.h"

namespace TknCtl::Model {

const Lcore* EnsSection::Find(std::uint64_t id) const {
    for (const auto& lcore : lcores) {
        if (lcore.id == id) return &lcore;
    }
    return nullptr;
}

Lcore* EnsSection::Find(std::uint64_t id) {
    return const_cast<Lcore*>(static_cast<const EnsSection*>(this)->Find(id));
}

namespace {

void Load(const Json::In& in, EnsSection& section) {
    section.maxLcores = in.Int<std::uint64_t>("maxLcores", section.maxLcores);
    section.numaNodes = in.Int<std::uint32_t>("numaNodes", section.numaNodes);
    in.Each("lcores", [&](const Json::In& item) {
        Lcore lcore;
        lcore.id = item.Int<std::uint64_t>("id");
        lcore.switchName = item.Str("switch", "null");
        lcore.affinity = item.Int<std::uint32_t>("affinity", 0);
        item.Done();
        section.lcores.push_back(std::move(lcore));
    });
    in.Done();
}

Json::Node Save(const EnsSection& section) {
    Json::Node lcores = Json::Node::array();
    for (const auto& l : section.lcores) {
        lcores.push_back({{"id", l.id}, {"switch", l.switchName}, {"affinity", l.affinity}});
    }
    return Json::Node{
        {"maxLcores", section.maxLcores}, {"numaNodes", section.numaNodes}, {"lcores", std::move(lcores)}};
}

void Check(const EnsSection& section, Lib::Checker& checker) {
    RequireUnique(
        section.lcores, [](const Lcore& l) { return std::to_string(l.id); }, checker, "ENS context ID");
    if (section.maxLcores > kMaxLcoresLimit) {
        checker.Fail("maximum number of ENS contexts " + std::to_string(section.maxLcores) + " above " +
                     std::to_string(kMaxLcoresLimit));
    }
    if (section.numaNodes == 0) checker.Fail("a host has at least one NUMA node");
    for (const auto& l : section.lcores) {
        if (l.id >= section.maxLcores) {
            checker.Fail("ENS context ID " + std::to_string(l.id) + " not below the maximum " +
                         std::to_string(section.maxLcores));
        }
        if (l.affinity >= section.numaNodes) {
            checker.Fail("ENS context " + std::to_string(l.id) + " bound to NUMA node " +
                         std::to_string(l.affinity) + " of " + std::to_string(section.numaNodes));
        }
    }
}

}  // namespace

const Lib::SectionKind& EnsSection::Kind() {
    static const Json::JsonSection<EnsSection> kind("ens", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model

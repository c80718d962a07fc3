#include "model/worlds.h"

#include "model/values.h"

namespace TknCtl::Model {

const World* WorldsSection::Find(std::uint32_t id) const {
    for (const auto& world : worlds) {
        if (world.id == id) return &world;
    }
    return nullptr;
}

namespace {

void Load(const Json::In& in, WorldsSection& section) {
    in.Elements([&](const Json::In& item) {
        World world;
        world.id = item.Int<std::uint32_t>("id");
        world.name = item.Str("name");
        item.Done();
        section.worlds.push_back(std::move(world));
    });
}

Json::Node Save(const WorldsSection& section) {
    Json::Node out = Json::Node::array();
    for (const auto& world : section.worlds)
        out.push_back({{"id", world.id}, {"name", world.name}});
    return out;
}

void Check(const WorldsSection& section, Lib::Checker& checker) {
    RequireUnique(
        section.worlds, [](const World& w) { return std::to_string(w.id); }, checker, "world ID");
    for (const auto& world : section.worlds) {
        if (world.id == 0) checker.Fail("world ID 0 is reserved (no world)");
    }
}

}  // namespace

const Lib::SectionKind& WorldsSection::Kind() {
    static const Json::JsonSection<WorldsSection> kind("worlds", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model

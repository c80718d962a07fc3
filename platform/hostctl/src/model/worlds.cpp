#include "model/worlds.h"

#include "model/values.h"

namespace TknCtl::Model {

const World* WorldsSection::Find(std::uint32_t id) const {
    // Sockets, ports and functions name their worlds by ID: a host with thousands of each
    // looks worlds up thousands of times.
    auto lookup = [&]() -> const World* {
        auto hit = index.find(id);
        if (hit == index.end() || hit->second >= worlds.size() || worlds[hit->second].id != id)
            return nullptr;
        return &worlds[hit->second];
    };
    if (const World* world = lookup()) return world;
    // An unknown ID, or worlds changed since the index was made: index them again.
    index.clear();
    for (std::size_t i = 0; i < worlds.size(); ++i)
        index.emplace(worlds[i].id, i);
    return lookup();
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

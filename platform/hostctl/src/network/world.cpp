// Worlds.
#include "backend/host.h"
#include "backend/netstacks.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/resource/world.h"
#include "model/worlds.h"

namespace TknCtl::Resource {

WorldImpl::WorldImpl(std::uint32_t worldId) : worldId_(worldId) {}
WorldImpl::~WorldImpl() = default;

std::string WorldImpl::GetWorldName() const {
    Lib::Enter("TknCtl::Resource::WorldImpl::GetWorldName", std::to_string(worldId_));
    // A world of a real host is a process: its ID is the PID.
    if (auto* host = Lib::RealHost()) return host->GetNetstacks().WorldName(worldId_);
    const auto* world = Lib::Read<Model::WorldsSection>().Find(worldId_);
    if (!world) throw HostCtl::Lib::HostCtlException("World " + std::to_string(worldId_) + " does not exist");
    return world->name;
}

ResourceInfoImpl::ResourceInfoImpl() = default;
ResourceInfoImpl::~ResourceInfoImpl() = default;

std::string ResourceInfoImpl::GetWorldName(unsigned long worldId) {
    Lib::Enter("TknCtl::Resource::ResourceInfoImpl::GetWorldName", std::to_string(worldId));
    if (worldId > UINT32_MAX) throw HostCtl::Lib::HostCtlException("World " + std::to_string(worldId) + " does not exist");
    return WorldImpl(static_cast<std::uint32_t>(worldId)).GetWorldName();
}

}  // namespace TknCtl::Resource

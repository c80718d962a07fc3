// The host's worlds: its processes and virtual machines.
#pragma once

#include <cstdint>
#include <string>

#include "hostctl/lib/object.h"

namespace TknCtl::Resource {

// A world of the host, named by its ID.
class WorldImpl : public TknCtl::Lib::TknCtlObject {
public:
    explicit WorldImpl(std::uint32_t worldId);
    ~WorldImpl() override;
    // The world's name; a virtual machine's world is named "vmm0:" followed by the VM's name.
    // Throws HostCtlException for a world the host does not have.
    std::string GetWorldName() const;

private:
    std::uint32_t worldId_;
};

class ResourceInfoImpl : public TknCtl::Lib::TknCtlObject {
public:
    ResourceInfoImpl();
    ~ResourceInfoImpl() override;
    // As WorldImpl(worldId).GetWorldName().
    std::string GetWorldName(unsigned long worldId);
};

}  // namespace TknCtl::Resource

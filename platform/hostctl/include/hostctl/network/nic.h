// Physical NICs (adapters).
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "hostctl/lib/object.h"
#include "hostctl/network/portset.h"
#include "hostctl/network/types.h"

namespace HostCtl::Network {

// A physical NIC of the host.
class Pnic {
public:
    virtual ~Pnic();
    virtual std::string GetName() const = 0;
};

}  // namespace HostCtl::Network

namespace TknCtl::Network {

// A physical NIC, named by its name.
class PnicImpl : public HostCtl::Network::Pnic, public TknCtl::Lib::TknCtlObject {
public:
    explicit PnicImpl(std::string name);
    ~PnicImpl() override;

    // True when the host has a physical NIC of that name.
    static bool IsValidPnic(const std::string& name);

    std::string GetName() const override;
    // The NIC's own (uplink) port on the switch that uses it, or nothing.
    std::unique_ptr<HostCtl::Network::Port> GetPort() const;

private:
    std::string name_;
};

}  // namespace TknCtl::Network

// The entry points to the host's network: the host and its factories, the network
// information object, and the information object over all switches.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "hostctl/lib/object.h"
#include "hostctl/network/portset.h"
#include "hostctl/network/types.h"

namespace HostCtl::System {
class SystemInfo;
}

namespace HostCtl::Network {

// Defined with the operations that use them.
class Pnic;                // nic.h
class PortGroup;           // vswitch.h
class VirtualSwitch;       // vswitch.h
class NicTeamingPolicy;    // vswitch.h
class PortSecurityPolicy;  // vswitch.h
class ShapingPolicy;       // vswitch.h
class NicCapabilities;     // vswitch.h
class TarkonNicInfo;       // tknnic.h
class NetstackInstance;    // netstack.h
struct TcpIpConnection;    // ip.h
struct SriovNicVFInfo;     // nic.h
struct SriovNicVFStats;    // nic.h

// The state value of a netstack instance that is enabled (created in the kernel).
constexpr std::uint32_t NETSTACK_STATE_ENABLED = 4660;

// The host's network information.
class NetworkInfo : public TknCtl::Lib::TknCtlObject {
public:
    ~NetworkInfo() override;

    // Every physical NIC in the library's order (an entry may be empty).
    virtual std::vector<std::unique_ptr<Pnic>> GetPnics() = 0;
    // The NIC of that name, or nothing.
    virtual std::unique_ptr<Pnic> GetPnicByName(const std::string& name) = 0;
    // NETSTACK_STATE_ENABLED for an enabled netstack instance; 0 for one that exists only in
    // the configuration, and for a dedicated netstack ("glidex", "faultTolerance",
    // "PellixProvisioning") not created yet; throws for any other unknown key.
    virtual std::uint32_t GetNetstackInstanceState(const std::string& key) = 0;
    virtual std::unique_ptr<TarkonNicInfo> GetTarkonNicInfo() = 0;

    // ENS contexts ("lcores"): the host-wide maximum, the contexts, their switch and NUMA
    // affinity. A request the host declines without error returns false.
    static std::uint64_t GetMaxLcores();
    static bool SetMaxLcores(unsigned long maxLcores);
    static bool AddLcore(unsigned long lcoreId);
    static bool RemoveLcore(unsigned long lcoreId);
    static std::vector<std::uint64_t> GetLcoreList();
    static std::string GetLcoreSwitch(unsigned long lcoreId);
    static bool AddLcoreSwitch(const std::string& switchName, unsigned long lcoreId);
    static std::uint32_t GetLcoreAffinity(unsigned long lcoreId);
    static bool SetLcoreAffinity(unsigned int numaNode, unsigned long lcoreId);
};

class NetworkFactory {
public:
    static std::unique_ptr<NetworkInfo> GetNetworkInfo();
    // The distributed switch of that name, or nothing.
    static std::unique_ptr<DVSwitch> GetDVSwitchByName(std::string name);
    // The port group of that name, or nothing.
    static std::unique_ptr<PortGroup> GetPortGroupByName(std::string name);
    // The standard switch of that name; throws HostCtlException when there is none.
    static std::unique_ptr<VirtualSwitch> GetVirtualSwitchById(std::string name);
    // The distributed port a parameter names; throws when the switch or port does not exist.
    static std::unique_ptr<DVPort> GetDVPort(const DVPortParam& param);
};

}  // namespace HostCtl::Network

namespace HostCtl {

class Host {
public:
    virtual ~Host();
    virtual std::unique_ptr<Network::NetworkInfo> GetNetworkInfo();
    virtual std::unique_ptr<System::SystemInfo> GetSystemInfo();
};

class HostFactory {
public:
    static std::unique_ptr<Host> GetHost();
};

}  // namespace HostCtl

namespace TknCtl::Network {

class NetworkInfoImpl : public HostCtl::Network::NetworkInfo {
public:
    NetworkInfoImpl();
    ~NetworkInfoImpl() override;

    // Physical NICs.
    std::vector<std::unique_ptr<HostCtl::Network::Pnic>> GetPnics() override;
    std::unique_ptr<HostCtl::Network::Pnic> GetPnicByName(const std::string& name) override;

    // Netstack instances.
    std::uint32_t GetNetstackInstanceState(const std::string& key) override;
    void AddNetstackInstance(HostCtl::Network::NetstackInstance* instance, bool disabled);
    std::vector<std::unique_ptr<HostCtl::Network::NetstackInstance>> ListNetstackInstances();
    std::unique_ptr<HostCtl::Network::NetstackInstance> LookupNetstackInstanceByKey(const std::string& key);
    void RemoveNetstackInstance(const std::string& key, bool force);

    // Tarkon interfaces.
    std::unique_ptr<HostCtl::Network::TarkonNicInfo> GetTarkonNicInfo() override;

    // Port groups of all standard switches, in the library's order.
    std::vector<std::unique_ptr<HostCtl::Network::PortGroup>> GetAllPortGroups();

    // The IPv6 switch of the Tarkon stacks; takes effect at once.
    bool IsTknIpv6Enabled();
    void SetTknIpv6Enabled(bool enabled);

    // Current connections of one class on one netstack.
    void GetCurrentTcpTarkonConnections(std::vector<HostCtl::Network::TcpIpConnection>& out,
                                        const std::string& netstack);
    void GetCurrentUdpTarkonConnections(std::vector<HostCtl::Network::TcpIpConnection>& out,
                                        const std::string& netstack);
    void GetCurrentIpTarkonConnections(std::vector<HostCtl::Network::TcpIpConnection>& out,
                                       const std::string& netstack);

    // SR-IOV.
    std::vector<std::unique_ptr<HostCtl::Network::Pnic>> GetSriovNics();
    std::unique_ptr<HostCtl::Network::Pnic> GetSriovNicByName(const std::string& name);
    std::vector<HostCtl::Network::SriovNicVFInfo> GetSriovNicVFInfo(const std::string& name);
    void GetSriovNicVFStats(HostCtl::Network::SriovNicVFStats* stats, const std::string& name,
                            std::uint8_t vfId);
};

// Every switch of the host.
class VirtualSwitchInfoImpl : public TknCtl::Lib::TknCtlObject {
public:
    VirtualSwitchInfoImpl();
    ~VirtualSwitchInfoImpl() override;

    // All switches (standard, distributed, opaque), in the library's order.
    std::vector<std::unique_ptr<HostCtl::Network::Portset>> GetAllSwitches();
    bool IsLegacySwitch(const std::string& name);
    bool IsDVSwitch(const std::string& name);
    bool IsOpaqueSwitch(const std::string& name);

    // Distributed switches.
    std::vector<std::unique_ptr<HostCtl::Network::DVSwitch>> GetDVSwitches();
    // The distributed switch of that name, or nothing.
    std::unique_ptr<HostCtl::Network::DVSwitch> GetDVSwitchByName(const std::string& name);

    // Standard switches.
    std::unique_ptr<HostCtl::Network::VirtualSwitch> AddVirtualSwitchWithPolicy(
        const HostCtl::Network::NicTeamingPolicy& teaming,
        const HostCtl::Network::PortSecurityPolicy& security, const HostCtl::Network::ShapingPolicy& shaping,
        const HostCtl::Network::NicCapabilities& capabilities, const std::string& name,
        std::uint32_t numPorts);
    // The standard switch of that name, or nothing.
    std::unique_ptr<HostCtl::Network::VirtualSwitch> GetVirtualSwitchByName(const std::string& name);
    std::vector<std::unique_ptr<HostCtl::Network::VirtualSwitch>> GetVirtualSwitches();
    void RemoveVirtualSwitch(const std::string& name);
};

}  // namespace TknCtl::Network

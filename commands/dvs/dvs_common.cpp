// Pieces the distributed-switch, port and VM commands share.
#include <charconv>

#include "commands/dvs/dvs.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace::Dvs {

std::optional<std::int64_t> ParseDecimal(const std::string& text) {
    const char* begin = text.data();
    const char* end = begin + text.size();
    if (begin != end && *begin == '+') ++begin;
    std::int64_t value = 0;
    auto [rest, error] = std::from_chars(begin, end, value, 10);
    if (error != std::errc() || rest != end || begin == end) return std::nullopt;
    return value;
}

std::string UnknownSwitchMessage(const std::string& name) {
    return "Distributed switch '" + name + "' does not exist";
}

std::vector<std::unique_ptr<HostCtl::Network::DVSwitch>> SelectLacpSwitches(
    const Zorbel::CallSpec::Input& input) {
    std::vector<std::unique_ptr<HostCtl::Network::DVSwitch>> switches;
    if (input.HasParameter("dvs")) {
        const std::string& name = input.GetParameter("dvs");
        auto dvs = HostCtl::Network::NetworkFactory::GetDVSwitchByName(name);
        if (!dvs) Frame::Fail(UnknownSwitchMessage(name));
        switches.push_back(std::move(dvs));
        return switches;
    }
    TknCtl::Network::VirtualSwitchInfoImpl info;
    for (auto& dvs : info.GetDVSwitches()) {
        if (dvs) switches.push_back(std::move(dvs));
    }
    return switches;
}

std::unique_ptr<HostCtl::Network::Port> FindPort(std::int64_t portId) {
    TknCtl::Network::VirtualSwitchInfoImpl info;
    for (const auto& portset : info.GetAllSwitches()) {
        if (!portset) continue;
        for (auto& port : portset->GetPorts()) {
            if (!dynamic_cast<TknCtl::Network::PortImpl*>(port.get())) continue;
            if (static_cast<std::int64_t>(port->GetPortId()) == portId) return std::move(port);
        }
    }
    return nullptr;
}

}  // namespace TalvexCli::NetworkNamespace::Dvs

// Steps shared by the interface commands: finding an interface by name, connection points
// from the command line, and tag names.
#include <ctime>

#include "commands/ip_interface/ip_interface.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/portset.h"
#include "hostctl/network/vswitch.h"

namespace TalvexCli::NetworkNamespace::IpInterface {

using HostCtl::Network::ConnectionPoint;
using HostCtl::Network::DVPortParam;

const char* const kNoSuchInterface = "Unable to find a Tarkon interface with the name ";
const char* const kInterfaceNamePattern = "tkn([0-9]|[1-9][0-9]|1[0-9][0-9]|2[0-4][0-9]|25[0-5])";

std::unique_ptr<HostCtl::Network::TknNic> FindByName(const std::string& name) {
    TknCtl::Network::TarkonNicInfoImpl info;
    auto nics = info.GetTarkonNics();
    for (auto& nic : nics) {
        if (nic && nic->GetName() == name) return std::move(nic);
    }
    return nullptr;
}

bool CheckConnectionPointRules(const Zorbel::CallSpec::Input& input, const OutputPtr& output) {
    bool portGroup = input.HasParameter("portgroup-name");
    bool dvsName = input.HasParameter("dvs-name");
    bool dvPortId = input.HasParameter("dvport-id");
    if (!(dvsName && dvPortId)) {
        if (!portGroup || dvsName != dvPortId) {
            output->AddErrorMessage(
                "A connection point of either vswitch port group name or dvs-name/dvport-id should be "
                "specified. If "
                "connection point is DVPort, --dvs-name and --dvport-id must be specified at the same time.");
            return false;
        }
    } else if (portGroup) {
        output->AddErrorMessage("Only one connection point can be specified, vswitch port group or DVPort.");
        return false;
    }
    return true;
}

std::unique_ptr<ConnectionPoint> BuildConnectionPoint(const Zorbel::CallSpec::Input& input,
                                                      const OutputPtr& output) {
    std::unique_ptr<ConnectionPoint> point;
    if (!(input.HasParameter("dvs-name") && input.HasParameter("dvport-id"))) {
        const std::string& name = input.GetParameter("portgroup-name");
        bool built = Frame::HostCall(output, "Invalid vswitch port group name " + name + ". Error was: ",
                                     [&] { point = std::make_unique<TknCtl::Network::PortGroupImpl>(name); });
        if (!built) return nullptr;
    } else {
        const std::string& dvsName = input.GetParameter("dvs-name");
        bool built = Frame::HostCall(
            output, "Unable to retrieve DVS info by specified DVS name " + dvsName + ". Error was: ", [&] {
                auto dvs = HostCtl::Network::NetworkFactory::GetDVSwitchByName(dvsName);
                if (!dvs) Frame::Fail("Distributed switch " + dvsName + " does not exist");
                DVPortParam param(dvs->GetUuid(), input.GetParameter("dvport-id"), 0);
                {
                    TknCtl::Network::DVPortImpl port(param);
                    if (port.IsValid()) {
                        std::uint32_t connectionId = port.GetConnectionId();
                        if (connectionId == 0) {
                            connectionId = static_cast<std::uint32_t>(std::time(nullptr));
                            port.SetConnectionId(connectionId);
                        }
                        param.SetConnectionId(connectionId);
                    }
                }
                point = std::make_unique<TknCtl::Network::DVPortImpl>(param);
            });
        if (!built) return nullptr;
    }
    if (!point->IsValid()) {
        output->AddErrorMessage("Invalid vswitch port group or DVPort parameters.");
        return nullptr;
    }
    return point;
}

std::string SupportedTags() {
    std::string tags;
    for (auto type = HostCtl::Network::TKNNIC_TAG_FIRST; type <= HostCtl::Network::TKNNIC_TAG_LAST; ++type) {
        if (!tags.empty()) tags += ", ";
        tags += TknCtl::Network::TknNicTagIdToName(type);
    }
    return tags;
}

HostCtl::Network::TknNicTagType TagType(const std::string& tagName, const OutputPtr& output) {
    auto type = TknCtl::Network::TknNicTagNameToId(tagName);
    if (type == HostCtl::Network::TKNNIC_TAG_INVALID) {
        output->AddErrorMessage("Invalid tag name " + tagName);
        output->AddErrorMessage("Supported tags are: " + SupportedTags());
        return 0;
    }
    return type;
}

}  // namespace TalvexCli::NetworkNamespace::IpInterface

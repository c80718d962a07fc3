#include "commands/ip_interface/ip_interface.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::TknNicTagType;

IpInterfaceTagAdd::IpInterfaceTagAdd() {
    SetDescription(std::string("Adds a tag on a given Tarkon network interface. Supported tags are: ") +
                   IpInterface::SupportedTags());
    SetMetaDataField("type", "operation");
}

InputSpecPtr IpInterfaceTagAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"interface-name", "i", Frame::kString,
         "The name of the Tarkon network interface on which tags should be set. This name must be an "
         "interface "
         "listed in the interface list command.",
         Frame::kRequired},
        {"tagname", "t", Frame::kString, "Tag name to assign to the interface", Frame::kRequired},
    });
}

OutputSpecPtr IpInterfaceTagAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

namespace {

// The netstack a tag type is bound to; the default netstack for the others.
std::string NetstackOfTag(TknNicTagType tag) {
    switch (tag) {
        case 2:
            return "glidex";
        case 3:
            return "faultTolerance";
        case 6:
            return "PellixProvisioning";
        default:
            return Frame::kDefaultNetstack;
    }
}

}  // namespace

void IpInterfaceTagAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("interface-name");
    const std::string& tagName = input->GetParameter("tagname");
    Frame::HostCall(output, "Error setting tag " + tagName + " on interface " + name + ". Error was : ", [&] {
        TknCtl::Network::TarkonNicInfoImpl info;
        TknNicTagType tag = IpInterface::TagType(tagName, output);
        if (tag == 0) return;
        std::string netstack = NetstackOfTag(tag);

        auto networkInfo = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        if (netstack != Frame::kDefaultNetstack &&
            networkInfo->GetNetstackInstanceState(netstack) == HostCtl::Network::NETSTACK_STATE_ENABLED) {
            std::vector<std::string> names;
            info.GetTarkonNicNamesByInstanceKey(names, netstack);
            if (!names.empty()) {
                output->AddErrorMessage("Failed to add " + tagName +
                                        " tag when dedicated stack is instantiated");
                return;
            }
        }

        auto nic = info.GetTarkonNicByInterface(name, false);
        if (!nic) {
            output->AddErrorMessage("Unable to find tknnic with name " + name);
            return;
        }
        std::string nicNetstack = nic->GetNetstackInstance();
        if ((nicNetstack == "glidex" && tag != 2) || (nicNetstack == "faultTolerance" && tag != 3) ||
            (nicNetstack == "PellixProvisioning" && tag != 6)) {
            output->AddErrorMessage("netstack mismatch for tag" + tagName);
            return;
        }
        nic->AddTag(tag, false);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

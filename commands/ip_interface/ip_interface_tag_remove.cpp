#include "commands/ip_interface/ip_interface.h"

namespace TalvexCli::NetworkNamespace {

IpInterfaceTagRemove::IpInterfaceTagRemove() {
    Frame::Describe(*this, {"Removes a tag on a given Tarkon network interface.", "operation"});
}

InputSpecPtr IpInterfaceTagRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"interface-name", "i", Frame::kString,
         "The name of the Tarkon network interface from which tags should be removed. This name must be an "
         "interface listed  in the interface list command.",
         Frame::kRequired},
        {"tagname", "t", Frame::kString, "Tag name to assign to the interface", Frame::kRequired},
    });
}

OutputSpecPtr IpInterfaceTagRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpInterfaceTagRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("interface-name");
    const std::string& tagName = input->GetParameter("tagname");
    Frame::HostCall(output,
                    "Error removing tag " + tagName + " from interface " + name + ". Error was : ", [&] {
                        auto tag = IpInterface::TagType(tagName, output);
                        if (tag == 0) return;
                        TknCtl::Network::TarkonNicInfoImpl info;
                        auto nic = info.GetTarkonNicByInterface(name, false);
                        if (!nic) {
                            output->AddErrorMessage("Unable to find tknnic with name " + name);
                            return;
                        }
                        nic->RemoveTag(tag);
                        Frame::SetResult(output, true);
                    });
}

}  // namespace TalvexCli::NetworkNamespace

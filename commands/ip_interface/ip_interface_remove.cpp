#include "commands/ip_interface/ip_interface.h"

namespace TalvexCli::NetworkNamespace {

IpInterfaceRemove::IpInterfaceRemove() {
    Frame::Describe(
        *this,
        {"Remove a Tarkon network interface from the Hadro host. A Tarkon network interface can be "
         "uniquely specified by --interface-name or --portgroup-name or --dvs-name/--dvport-id. i.e. "
         "Providing its name or its connection point are two ways to uniquely specify a Tarkon network "
         "interface.",
         "operation"});
}

InputSpecPtr IpInterfaceRemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, use the default netstack instance"},
        {"portgroup-name", "p", Frame::kString,
         "The name of the vswitch port group to delete this Tarkon network interface from."},
        {"dvs-name", "s", Frame::kString,
         "DVSwitch name of the connection point. This requires --dvport-id to be given in the same command"},
        {"dvport-id", "P", Frame::kString,
         "DVPort ID of the connection point. This requires --dvs-name to be given in the same command"},
        {"interface-name", "i", Frame::kString,
         "The name of the Tarkon network interface to remove. This name must be in the form tknX, where X is "
         "a "
         "number 0-255",
         Frame::kOptional, Frame::Regex(IpInterface::kInterfaceNamePattern)},
    });
}

OutputSpecPtr IpInterfaceRemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpInterfaceRemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    bool byName = input->HasParameter("interface-name");
    bool byPoint = input->HasParameter("portgroup-name") || input->HasParameter("dvs-name") ||
                   input->HasParameter("dvport-id");
    if (byName == byPoint) {
        output->AddErrorMessage(
            "Please correctly and uniquely specify a way to remove it. A Tarkon network interface can be "
            "uniquely "
            "specified by --interface-name or --portgroup-name or --dvs-name/--dvport-id. i.e. Providing its "
            "name or "
            "its connection point are two ways to uniquely specify a Tarkon network interface.");
        return;
    }
    const std::string prefix = "Unable to remove Tarkon network interface. Error was : ";

    if (byName) {
        const std::string& name = input->GetParameter("interface-name");
        Frame::HostCall(output, prefix, [&] {
            auto nic = IpInterface::FindByName(name);
            if (!nic) {
                output->AddErrorMessage("Unable to find Tarkon network interface with the name " + name);
                Frame::SetResult(output, false);
                return;
            }
            nic->Remove();
            Frame::SetResult(output, true);
        });
        return;
    }

    if (!IpInterface::CheckConnectionPointRules(*input, output)) return;
    auto point = IpInterface::BuildConnectionPoint(*input, output);
    if (!point) return;
    Frame::HostCall(output, prefix, [&] {
        TknCtl::Network::TarkonNicInfoImpl info;
        info.RemoveTarkonNic(point.get(), Frame::Netstack(*input));
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

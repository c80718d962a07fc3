#include "commands/ip_interface/ip_interface.h"
#include "hostctl/util.h"

namespace TalvexCli::NetworkNamespace {

using HostCtl::Network::IpConfig;
using HostCtl::Network::MacAddress;
using HostCtl::Network::TknNic;
using HostCtl::Network::TknNicTagType;

IpInterfaceAdd::IpInterfaceAdd() {
    Frame::Describe(*this, {"Add a new Tarkon network interface.", "operation"});
}

InputSpecPtr IpInterfaceAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, use the default netstack instance"},
        {"portgroup-name", "p", Frame::kString,
         "The name of the vswitch port group to add this Tarkon network interface to."},
        {"dvs-name", "s", Frame::kString,
         "DVSwitch name of the connection point. This requires --dvport-id to be given in the same command"},
        {"dvport-id", "P", Frame::kString,
         "DVPort ID of the connection point. This requires --dvs-name to be given in the same command"},
        {"mtu", "m", Frame::kInt, "Set the MTU setting for a given Tarkon network interface on creation",
         Frame::kOptional, Frame::Range(TknNic::MIN_MTU, TknNic::MAX_MTU)},
        {"num-rxqueue", "R", Frame::kInt,
         "Set the number of RX dispatch queues for a given Tarkon network interface on creation",
         Frame::kOptional, Frame::Range(1, 1000)},
        {"mac-address", "M", Frame::kString,
         "Set the MAC address for the newly created Tarkon network interface."},
        {"interface-name", "i", Frame::kString,
         "The name of the Tarkon network interface to create. This name must be in the form tknX, where X is "
         "a "
         "number 0-255",
         Frame::kOptional, Frame::Regex(IpInterface::kInterfaceNamePattern)},
    });
}

OutputSpecPtr IpInterfaceAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

namespace {

// The tag a dedicated netstack carries, or 0.
TknNicTagType DedicatedTag(const std::string& netstack) {
    if (netstack == "glidex") return 2;
    if (netstack == "faultTolerance") return 3;
    if (netstack == "PellixProvisioning") return 6;
    return 0;
}

// Gives the tag to the new interface and takes it from the interfaces of the default netstack.
void MoveTag(TknNic& nic, TknNicTagType tag) {
    nic.AddTag(tag, false);
    TknCtl::Network::TarkonNicInfoImpl info;
    for (const auto& other : info.GetTarkonNicsByTag(tag)) {
        if (other->GetNetstackInstance() == Frame::kDefaultNetstack) other->RemoveTag(tag);
    }
}

}  // namespace

void IpInterfaceAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    if (!IpInterface::CheckConnectionPointRules(*input, output)) return;

    MacAddress mac;
    if (input->HasParameter("mac-address")) {
        const std::string& text = input->GetParameter("mac-address");
        if (!MacAddress::IsValid(text)) {
            output->AddErrorMessage("Invalid unicast MAC address specified.");
            return;
        }
        mac = MacAddress(text);
    }
    unsigned mtu = input->HasParameter("mtu") ? static_cast<unsigned>(input->GetParameterInt("mtu")) : 0;
    unsigned rxQueues =
        input->HasParameter("num-rxqueue") ? static_cast<unsigned>(input->GetParameterInt("num-rxqueue")) : 0;
    std::string name =
        input->HasParameter("interface-name") ? input->GetParameter("interface-name") : std::string();

    auto point = IpInterface::BuildConnectionPoint(*input, output);
    if (!point) return;

    Frame::HostCall(output, "Unable to add Tarkon network interface. Error was : ", [&] {
        std::string netstack = Frame::Netstack(*input);
        TknCtl::Network::TarkonNicInfoImpl info;
        auto nic = info.AddTarkonNic(point.get(), netstack, IpConfig(), mac, 0, mtu, rxQueues, name);

        if (TknNicTagType tag = DedicatedTag(netstack)) MoveTag(*nic, tag);
        if (netstack == "PellixProvisioning" &&
            TknCtl::Util::TknCtl_Exec("/etc/init.d/nfcd restart", false, true, false) != 0) {
            output->AddErrorMessage(
                "Unable to start the NFC daemon. Take a look at /var/log/nfcd.log for more information.");
        }

        IpConfig config;
        config.SetUseIpv6RouterAdvertised(true);
        nic->SetIpConfig(config);
        nic->Refresh();
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

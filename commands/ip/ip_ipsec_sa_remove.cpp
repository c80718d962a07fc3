#include "commands/ip/ip.h"
#include "hostctl/network/ipsec.h"

namespace TalvexCli::NetworkNamespace {

IpIpsecSARemove::IpIpsecSARemove() {
    Frame::Describe(*this, {"Operation to remove Security Association(s)", "operation"});
}

InputSpecPtr IpIpsecSARemove::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"sa-name", "n", Frame::kString,
         "Name for the Security Association to be removed. Specify 'auto' to remove an auto SA."},
        {"remove-all", "a", Frame::kFlag, "Set to remove all Security Associations."},
        {"sa-source", "s", Frame::kString,
         "Ipv6 address of Security Association source. This option needs to be specified when removing an "
         "auto SA."},
        {"sa-destination", "d", Frame::kString,
         "Ipv6 address of Security Association destination. This option needs to be specified when removing "
         "an auto SA."},
        {"sa-spi", "p", Frame::kString,
         "SPI value for the Security Association (hex). This option needs to be specified when removing an "
         "auto SA"},
    });
}

OutputSpecPtr IpIpsecSARemove::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpIpsecSARemove::ExecuteInternal(InputPtr input, OutputPtr output) {
    const bool hasName = input->HasParameter("sa-name");
    const std::string& name = input->GetParameter("sa-name");
    const bool all = input->IsFlagSet("remove-all");
    const bool hasSource = input->HasParameter("sa-source");
    const bool hasDestination = input->HasParameter("sa-destination");
    const bool hasSpi = input->HasParameter("sa-spi");
    const bool autoSa = hasName && name == "auto";

    Frame::HostCall(output, [&] {
        if (hasName && !autoSa && !all && !hasSource && !hasDestination && !hasSpi) {
            TknCtl::Network::IpSecConfigImpl ipsec;
            ipsec.RemoveSADConfig(name);
        } else if (autoSa && hasSource && hasDestination && hasSpi && !all) {
            HostCtl::Network::IpSecSadParam sa;
            sa.source = HostCtl::Network::Ipv6Address(input->GetParameter("sa-source"));
            sa.destination = HostCtl::Network::Ipv6Address(input->GetParameter("sa-destination"));
            // The SPI is read and checked as "sa add" does.
            const std::string& spi = input->GetParameter("sa-spi");
            if (!Ipsec::ParseSpi(spi, sa.spi)) Frame::Fail(Ipsec::SpiMessage(spi));
            TknCtl::Network::IpSecConfigImpl ipsec;
            ipsec.RemoveAutoSADConfig(sa);
        } else if (all && !hasName && !hasSource && !hasDestination && !hasSpi) {
            TknCtl::Network::IpSecConfigImpl ipsec;
            ipsec.FlushSADConfig();
        } else {
            Frame::Fail(
                "Can not figure out which operation you want to perform.\n"
                "Remove a unique SA: Only specify the '--sa-name' option to remove a normal SA.\n"
                "Remove an auto SA: Set the '--sa-name' to 'auto'. You should also specify '--sa-source', "
                "'--sa-destination' and '--sa-spi' and omit '--remove-all' when removing an auto SA.\n"
                "Remove all SAs: You should only set the flag '--remove-all' to remove all SAs.");
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

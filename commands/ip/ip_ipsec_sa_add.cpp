#include "commands/ip/ip.h"
#include "hostctl/network/ipsec.h"

namespace TalvexCli::NetworkNamespace {

IpIpsecSAAdd::IpIpsecSAAdd() {
    Frame::Describe(*this, {"Add a Security Association.", "operation"});
}

InputSpecPtr IpIpsecSAAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"sa-name", "n", Frame::kString, "Name for the Security Association to be added.", Frame::kRequired},
        {"sa-source", "s", Frame::kString,
         "Ipv6 address of Security Association source. Can be specified as 'any' or a correct IPv6 address.",
         Frame::kRequired},
        {"sa-destination", "d", Frame::kString,
         "Ipv6 address of Security Association destination. Can be specified as 'any' or a correct IPv6 "
         "address.",
         Frame::kRequired},
        {"sa-mode", "m", Frame::kString, "Security Association mode. Should be one in set %ENUM%.",
         Frame::kOptional, Frame::StringEnum({{"transport", ""}, {"tunnel", ""}})},
        {"sa-spi", "p", Frame::kString, "SPI value for the Security Association(hex).", Frame::kRequired},
        {"encryption-algorithm", "e", Frame::kString,
         "Encryption algorithm for the Security Association. Should be one in set %ENUM%.", Frame::kRequired,
         Frame::StringEnum({{"null", ""}, {"3des-cbc", ""}, {"aes128-cbc", ""}})},
        {"encryption-key", "k", Frame::kString,
         "Encryption key(ASCII or hex). Length of hex key is dependent upon algorithm used. Required when a "
         "encryption algorithm has been specified."},
        {"integrity-algorithm", "i", Frame::kString,
         "Integrity algorithm for the Security Association. Should be one in set %ENUM%.", Frame::kRequired,
         Frame::StringEnum({{"hmac-sha1", ""}, {"hmac-sha2-256", ""}})},
        {"integrity-key", "K", Frame::kString,
         "Integrity key(ASCII or hex). Length of hex key is dependent upon algorithm used.",
         Frame::kRequired},
    });
}

OutputSpecPtr IpIpsecSAAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

namespace {
// "any" stands for the unspecified address.
HostCtl::Network::Ipv6Address SaAddress(const std::string& text) {
    return text == "any" ? HostCtl::Network::Ipv6Address() : HostCtl::Network::Ipv6Address(text);
}
}  // namespace

void IpIpsecSAAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::Network::IpSecConfigImpl ipsec;
        HostCtl::Network::IpSecSadParam sa;
        sa.name = input->GetParameter("sa-name");
        sa.source = SaAddress(input->GetParameter("sa-source"));
        sa.destination = SaAddress(input->GetParameter("sa-destination"));

        const std::string& spi = input->GetParameter("sa-spi");
        if (!Ipsec::ParseSpi(spi, sa.spi)) Frame::Fail(Ipsec::SpiMessage(spi));

        sa.mode = ipsec.StringToIpSecMode(input->GetParameter("sa-mode"));
        sa.encryptionAlgorithm = ipsec.StringToIpSecEncyptAlgo(input->GetParameter("encryption-algorithm"));
        sa.integrityAlgorithm = ipsec.StringToIpSecAuthAlgo(input->GetParameter("integrity-algorithm"));
        sa.integrityKey = input->GetParameter("integrity-key");

        if (input->HasParameter("encryption-key")) {
            sa.encryptionKey = input->GetParameter("encryption-key");
        } else if (sa.encryptionAlgorithm != HostCtl::Network::IPSEC_ENCRYPT_NULL) {
            Frame::Fail("Missing encryption key");
        }

        ipsec.AddSADConfig(sa);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

#include <limits>

#include "commands/ip/ip.h"
#include "hostctl/network/ipsec.h"

namespace TalvexCli::NetworkNamespace {

IpIpsecSPAdd::IpIpsecSPAdd() {
    Frame::Describe(*this, {"Add a Security Policy.", "operation"});
}

InputSpecPtr IpIpsecSPAdd::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"sp-name", "n", Frame::kString, "Name for the Security Policy to be added.", Frame::kRequired},
        {"sa-name", "a", Frame::kString,
         "Name for the Security Association. Not being Specified lets tarkon automatically choose an "
         "Security "
         "Association. If no applicable Security Association exists, then tarkon may request one using IKE."},
        {"sp-source", "s", Frame::kString,
         "Ipv6 address and prefix length of Security Policy source. Can be specified as 'any' or a correct "
         "IPv6 network address.",
         Frame::kRequired},
        {"sp-destination", "d", Frame::kString,
         "Ipv6 address and prefix length of Security Policy destination. Can be specified as 'any' or a "
         "correct Ipv6 network address.",
         Frame::kRequired},
        {"sp-mode", "m", Frame::kString, "Security Policy mode. Should be one in set %ENUM%.",
         Frame::kOptional, Frame::StringEnum({{"transport", ""}, {"tunnel", ""}})},
        {"source-port", "p", Frame::kInt, "Source Port for Security Policy. '0' stands for 'any'",
         Frame::kRequired},
        {"destination-port", "P", Frame::kInt, "Destination Port for Security Policy. '0' stands for 'any'",
         Frame::kRequired},
        {"action", "A", Frame::kString, "Action for Security Policy. Should be one in set %ENUM%.",
         Frame::kOptional, Frame::StringEnum({{"none", ""}, {"discard", ""}, {"ipsec", ""}})},
        {"upper-layer-protocol", "u", Frame::kString,
         "Upper layer protocol for Security Policy, Should be one in set %ENUM%.", Frame::kOptional,
         Frame::StringEnum({{"any", ""}, {"tcp", ""}, {"udp", ""}, {"icmp6", ""}})},
        {"flow-direction", "w", Frame::kString,
         "Flow direction for Security Policy. Should be one in set %ENUM%.", Frame::kOptional,
         Frame::StringEnum({{"in", ""}, {"out", ""}})},
    });
}

OutputSpecPtr IpIpsecSPAdd::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

namespace {

// A port as the record holds it. A value the record cannot hold would come out as another
// port, so it is refused here in the host's words.
std::uint32_t Port(std::int64_t value, const char* what) {
    if (value < 0 || value > static_cast<std::int64_t>(std::numeric_limits<std::uint32_t>::max())) {
        Frame::Fail(std::string(what) + " port " + std::to_string(value) +
                    " is out of range: a port is from 0 to 65535 (0 for any)");
    }
    return static_cast<std::uint32_t>(value);
}

// "any" keeps the unspecified network ::/0.
HostCtl::Network::Ipv6Network SpNetwork(const std::string& text) {
    return text == "any" ? HostCtl::Network::Ipv6Network() : HostCtl::Network::Ipv6Network(text);
}

}  // namespace

void IpIpsecSPAdd::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::Network::IpSecConfigImpl ipsec;
        HostCtl::Network::IpSecSpdParam sp;
        sp.saName = input->HasParameter("sa-name") ? input->GetParameter("sa-name") : std::string();
        sp.sourcePort = Port(input->GetParameterInt("source-port"), "Source");
        sp.destinationPort = Port(input->GetParameterInt("destination-port"), "Destination");

        auto source = SpNetwork(input->GetParameter("sp-source"));
        sp.sourceAddress = source.GetAddress();
        sp.sourcePrefixLength = source.GetNetmask();
        auto destination = SpNetwork(input->GetParameter("sp-destination"));
        sp.destinationAddress = destination.GetAddress();
        sp.destinationPrefixLength = destination.GetNetmask();

        // Absent options give empty texts, which the converters take for their defaults.
        const std::string& mode = input->GetParameter("sp-mode");
        const std::string& protocol = input->GetParameter("upper-layer-protocol");
        const std::string& direction = input->GetParameter("flow-direction");
        const std::string& action = input->GetParameter("action");
        sp.protocol = ipsec.StringToIpSecULProtoType(protocol);
        sp.direction = ipsec.StringToIpSecDirection(direction);
        sp.action = ipsec.StringToIpSecAction(action);
        // The mode matters only to policies that protect traffic.
        if (action == "ipsec") sp.mode = ipsec.StringToIpSecMode(mode);

        sp.spName = input->GetParameter("sp-name");
        ipsec.AddSPDConfig(sp);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

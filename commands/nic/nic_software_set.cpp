#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicSoftwareSet::NicSoftwareSet() {
    Frame::Describe(*this, {"Enable and disable software simulation settings on a NIC."});
}

namespace {

using Software = HostCtl::Network::PnicSoftwareSettings;

struct Switch {
    const char* parameter;
    const char* description;
    std::uint32_t bit;
    bool Software::*member;
};

// In the order of the help text.
const Switch kSwitches[] = {
    {"ipv4cso", "Configure IPv4 checksum offload software simulation.", HostCtl::Network::PNIC_SW_IPV4_CSO,
     &Software::ipv4Cso},
    {"ipv4tso", "Configure IPv4 TCP segmentation offload software simulation.",
     HostCtl::Network::PNIC_SW_IPV4_TSO, &Software::ipv4Tso},
    {"sg", "Configure scatter gather software simulation.", HostCtl::Network::PNIC_SW_SG, &Software::sg},
    {"obo", "Configure offset based encapsulation offload software simulation.",
     HostCtl::Network::PNIC_SW_OBO, &Software::obo},
    {"vxlanencap", "Configure VXLAN encapsulation offload software simulation.",
     HostCtl::Network::PNIC_SW_VXLAN_ENCAP, &Software::vxlanEncap},
    {"geneveoffload", "Configure Geneve encapsulation offload software simulation.",
     HostCtl::Network::PNIC_SW_GENEVE_OFFLOAD, &Software::geneveOffload},
    {"ipv6tso", "Configure IPv6 TCP segmentation offload software simulation.",
     HostCtl::Network::PNIC_SW_IPV6_TSO, &Software::ipv6Tso},
    {"ipv6tsoext", "Configure IPv6 extend header TCP segmentation offload software simulation.",
     HostCtl::Network::PNIC_SW_IPV6_TSO_EXT, &Software::ipv6TsoExt},
    {"ipv6cso", "Configure IPv6 checksum offload software simulation.", HostCtl::Network::PNIC_SW_IPV6_CSO,
     &Software::ipv6Cso},
    {"ipv6csoext", "Configure IPv6 extend header checksum offload software simulation.",
     HostCtl::Network::PNIC_SW_IPV6_CSO_EXT, &Software::ipv6CsoExt},
    {"highdma", "Configure high DMA software simulation.", HostCtl::Network::PNIC_SW_HIGH_DMA,
     &Software::highDma},
    {"sgsp", "Configure scatter gather span multiple pages software simulation.",
     HostCtl::Network::PNIC_SW_SG_SPAN_PAGES, &Software::sgSpanPages},
    {"tagging", "Configure TX VLAN tagging software simulation.", HostCtl::Network::PNIC_SW_VLAN_TAGGING,
     &Software::vlanTagging},
    {"untagging", "Configure RX VLAN untagging software simulation.",
     HostCtl::Network::PNIC_SW_VLAN_UNTAGGING, &Software::vlanUntagging},
};

}  // namespace

InputSpecPtr NicSoftwareSet::GetInputSpecInternal() {
    std::vector<Frame::Param> params{
        {"vmnic", "n", Frame::kString,
         "Name of the vmnic whose software similation settings should be updated.", Frame::kRequired}};
    for (const auto& s : kSwitches)
        params.push_back({s.parameter, "", Frame::kBool, s.description});
    return Frame::MakeInputSpec(params);
}

OutputSpecPtr NicSoftwareSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicSoftwareSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto pnic = info->GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        Software settings;
        for (const auto& s : kSwitches) {
            if (!input->HasParameter(s.parameter)) continue;
            settings.mask |= s.bit;
            settings.*s.member = input->GetParameterBool(s.parameter);
        }
        if (settings.mask != 0) pnic->SetSoftwareSettings(settings);
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace

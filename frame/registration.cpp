// The "network" command tree: every namespace with its description and every command under
// its verb, in creation order.
#include <map>
#include <memory>
#include <string>
#include <unordered_map>

#include "frame/factories.h"
#include "frame/registration.h"
#include "zorbel/autocli.h"

namespace TalvexCli::NetworkNamespace {

namespace {

using Zorbel::AutoCli::NamespaceNode;

#define NS(path, description) \
    { path, description, nullptr }
#define CMD(path, Class) \
    { path, nullptr, #Class }

// The subtree "network vswitch dvs talvex lacp" comes last, after "network ens".
const TreeEntry kTree[] = {
    NS("network",
       "Operations that pertain to the maintenance of networking on an Hadro host. This includes a wide "
       "variety of commands to manipulate virtual networking components (vswitch, portgroup, etc) as well as "
       "local host IP, DNS and general host networking settings."),
    NS("network ip", "Operations that can be performed on tknnics"),
    CMD("network ip get", IpGet),
    CMD("network ip set", IpSet),
    NS("network ip neighbor", "Operations that can be performed on arp tables"),
    CMD("network ip neighbor list", IpNeighborList),
    CMD("network ip neighbor remove", IpNeighborRemove),
    NS("network ip connection", "List active tcpip connections"),
    CMD("network ip connection list", IpConnectionList),
    NS("network ip dns", "Operations pertaining to Domain Name Server configuration."),
    NS("network ip dns server", "Operations pertaining to DNS server configuration."),
    CMD("network ip dns server list", IpDNSServerList),
    CMD("network ip dns server add", IpDNSServerAdd),
    CMD("network ip dns server remove", IpDNSServerRemove),
    NS("network ip dns search", "Operations pertaining to DNS search domain configuration."),
    CMD("network ip dns search add", IpDNSSearchAdd),
    CMD("network ip dns search remove", IpDNSSearchRemove),
    CMD("network ip dns search list", IpDNSSearchList),
    NS("network ip route", "Operations pertaining to route configuration"),
    NS("network ip route ipv4", "IPv4 route operations"),
    CMD("network ip route ipv4 add", IpRouteIpv4Add),
    CMD("network ip route ipv4 remove", IpRouteIpv4Remove),
    CMD("network ip route ipv4 list", IpRouteIpv4List),
    NS("network ip route ipv6", "IPv6 route operations"),
    CMD("network ip route ipv6 add", IpRouteIpv6Add),
    CMD("network ip route ipv6 remove", IpRouteIpv6Remove),
    CMD("network ip route ipv6 list", IpRouteIpv6List),
    NS("network ip ipsec", "Operations on Internet Protocol Security"),
    NS("network ip ipsec sa", "Operations pertaining to Security Association"),
    CMD("network ip ipsec sa add", IpIpsecSAAdd),
    CMD("network ip ipsec sa remove", IpIpsecSARemove),
    CMD("network ip ipsec sa list", IpIpsecSAList),
    NS("network ip ipsec sp", "Operations pertaining to Security Policy"),
    CMD("network ip ipsec sp add", IpIpsecSPAdd),
    CMD("network ip ipsec sp remove", IpIpsecSPRemove),
    CMD("network ip ipsec sp list", IpIpsecSPList),
    NS("network ip interface",
       "Operations having to do with the creation, management and deletion of Tarkon network interfaces "
       "(tknnic)."),
    CMD("network ip interface add", IpInterfaceAdd),
    CMD("network ip interface remove", IpInterfaceRemove),
    CMD("network ip interface list", IpInterfaceList),
    CMD("network ip interface set", IpInterfaceSet),
    NS("network ip interface ipv4", "Commands to get and set IPv4 settings for tknnic."),
    CMD("network ip interface ipv4 get", IpInterfaceIpv4Get),
    CMD("network ip interface ipv4 set", IpInterfaceIpv4Set),
    NS("network ip interface ipv4 address",
       "Commands for managing IPv4 addresses assigned to Tarkon network interfaces."),
    CMD("network ip interface ipv4 address list", IpInterfaceIpv4Get),
    NS("network ip interface ipv6", "Commands to get and set IPv6 settings for tknnic."),
    CMD("network ip interface ipv6 set", IpInterfaceIpv6Set),
    CMD("network ip interface ipv6 get", IpInterfaceIpv6Get),
    NS("network ip interface ipv6 address",
       "Commands to list and update IPv6 addresses assigned to the system."),
    CMD("network ip interface ipv6 address list", IpInterfaceIpv6AddressList),
    CMD("network ip interface ipv6 address add", IpInterfaceIpv6AddressAdd),
    CMD("network ip interface ipv6 address remove", IpInterfaceIpv6AddressRemove),
    NS("network ip interface tag", "Commands to add and remove tags on tknnics."),
    CMD("network ip interface tag add", IpInterfaceTagAdd),
    CMD("network ip interface tag remove", IpInterfaceTagRemove),
    CMD("network ip interface tag get", IpInterfaceTagGet),
    NS("network ip netstack",
       "Operations having to do with the creation, management and deletion of Tarkon Netstack Instances."),
    CMD("network ip netstack list", IpNetstackInstanceList),
    CMD("network ip netstack add", IpNetstackInstanceAdd),
    CMD("network ip netstack remove", IpNetstackInstanceRemove),
    CMD("network ip netstack get", IpNetstackInstanceGet),
    CMD("network ip netstack set", IpNetstackInstanceSet),
    NS("network multicast", "Operations having to do with multicast"),
    NS("network multicast group", "Operations to list multicast groups"),
    CMD("network multicast group list", MulticastGroupList),
    NS("network nic",
       "Operations having to do with the configuration of Network Interface Card and getting and updating "
       "the NIC settings."),
    CMD("network nic list", NicList),
    CMD("network nic up", NicUp),
    CMD("network nic get", NicGet),
    CMD("network nic set", NicSet),
    CMD("network nic down", NicDown),
    NS("network nic stats", "Get packet statistics for a NIC"),
    CMD("network nic stats get", NicStatsGet),
    NS("network nic vlan", "Get VLAN information for a NIC"),
    NS("network nic vlan stats", "Commands to access VLAN statistics for a NIC"),
    CMD("network nic vlan stats get", NicVlanStatsGet),
    CMD("network nic vlan stats set", NicVlanStatsSet),
    NS("network nic coalesce", "Commands to access coalesce paramaters for a NIC"),
    CMD("network nic coalesce get", NicCoalesceGet),
    CMD("network nic coalesce set", NicCoalesceSet),
    NS("network nic coalesce low", "Commands to access coalesce parameters for a NIC at low packet rate"),
    CMD("network nic coalesce low get", NicCoalesceLowGet),
    CMD("network nic coalesce low set", NicCoalesceLowSet),
    NS("network nic coalesce high", "Commands to access coalesce parameters for a NIC at high packet rate"),
    CMD("network nic coalesce high get", NicCoalesceHighGet),
    CMD("network nic coalesce high set", NicCoalesceHighSet),
    NS("network nic cso", "Commands to access checksum offload settings for a NIC"),
    CMD("network nic cso get", NicCsoGet),
    CMD("network nic cso set", NicCsoSet),
    NS("network nic tso", "Commands to access TCP segmentation offload settings for a NIC"),
    CMD("network nic tso get", NicTsoGet),
    CMD("network nic tso set", NicTsoSet),
    NS("network nic sg", "Commands to access scatter-gather settings for a NIC"),
    CMD("network nic sg get", NicSgGet),
    CMD("network nic sg set", NicSgSet),
    NS("network nic pauseParams", "Commands to access pause parameters for a NIC"),
    CMD("network nic pauseParams list", NicPauseParamsList),
    CMD("network nic pauseParams set", NicPauseParamsSet),
    NS("network nic register", "Commands to access registers for a NIC"),
    CMD("network nic register dump", NicRegisterDump),
    NS("network nic eeprom", "Commands to access EEPROM for a NIC"),
    CMD("network nic eeprom dump", NicEepromDump),
    CMD("network nic eeprom change", NicEepromChange),
    NS("network nic negotiate", "Commands to access negotiation feature on a NIC"),
    CMD("network nic negotiate restart", NicNegotiationRestart),
    NS("network nic selftest", "Commands to access self test feature on a NIC"),
    CMD("network nic selftest run", NicSelfTestRun),
    NS("network nic queue", "Commands to access RX/TX netqueue features on a NIC"),
    NS("network nic queue loadbalancer", "Commands to access load balancer features of netqueue"),
    CMD("network nic queue loadbalancer list", NicQueueLbSettingList),
    CMD("network nic queue loadbalancer set", NicQueueLbSettingSet),
    NS("network nic queue loadbalancer state", "Commands to access load balancer state on a NIC"),
    CMD("network nic queue loadbalancer state list", NicQueueLbStateList),
    CMD("network nic queue loadbalancer state set", NicQueueLbStateSet),
    NS("network nic queue loadbalancer plugin", "Commands to access load balancer plugins on a NIC"),
    CMD("network nic queue loadbalancer plugin list", NicQueueLbPluginList),
    CMD("network nic queue loadbalancer plugin set", NicQueueLbPluginSet),
    NS("network nic queue count", "Commands to access netqueue count on a NIC"),
    CMD("network nic queue count get", NicQueueCountGet),
    CMD("network nic queue count set", NicQueueCountSet),
    NS("network nic queue filterclass", "Commands to access supported filter class"),
    CMD("network nic queue filterclass list", NicQueueFilterClassList),
    NS("network nic software", "Commands to access NIC feature software simulation settings"),
    CMD("network nic software list", NicSoftwareList),
    CMD("network nic software set", NicSoftwareSet),
    NS("network nic ring", "Commands to access NIC RX/TX ring buffer parameters"),
    NS("network nic ring preset", "Commands to access preset NIC RX/TX ring buffer parameters"),
    CMD("network nic ring preset get", NicRingPresetGet),
    NS("network nic ring current", "Commands to access current NIC RX/TX ring buffer parameters"),
    CMD("network nic ring current get", NicRingCurrentGet),
    CMD("network nic ring current set", NicRingCurrentSet),
    NS("network sriovnic",
       "Operations having to do with the configuration of SRIOV enabled Network Interface Card and getting "
       "and updating the NIC settings."),
    CMD("network sriovnic list", SriovNicList),
    NS("network sriovnic vf", "Operations related to VFs of a SRIOV capable pNIC"),
    CMD("network sriovnic vf list", VfList),
    CMD("network sriovnic vf stats", VfStats),
    NS("network vswitch", "Commands to list and manipulate Virtual Switches on an Hadro host."),
    NS("network vswitch standard",
       "Commands to list and manipulate Legacy Virtual Switches on an Hadro host."),
    CMD("network vswitch standard add", VirtualSwitchStandardAdd),
    CMD("network vswitch standard set", VirtualSwitchStandardSet),
    CMD("network vswitch standard list", VirtualSwitchStandardList),
    CMD("network vswitch standard remove", VirtualSwitchStandardRemove),
    NS("network vswitch standard uplink", "Commands to add and remove uplink on given virtual switch."),
    CMD("network vswitch standard uplink add", VirtualSwitchStandardUplinkAdd),
    CMD("network vswitch standard uplink remove", VirtualSwitchStandardUplinkRemove),
    NS("network vswitch standard policy",
       "Commands to manipulate network policy settings governing the given virtual switch."),
    NS("network vswitch standard policy shaping",
       "Commands to manipulate shaping policy setting for the given virtual switch."),
    CMD("network vswitch standard policy shaping get", VirtualSwitchStandardPolicyShapingGet),
    CMD("network vswitch standard policy shaping set", VirtualSwitchStandardPolicyShapingSet),
    NS("network vswitch standard policy security",
       "Commands to manipulate security policy setting for the given virtual switch."),
    CMD("network vswitch standard policy security get", VirtualSwitchStandardPolicySecurityGet),
    CMD("network vswitch standard policy security set", VirtualSwitchStandardPolicySecuritySet),
    NS("network vswitch standard policy failover",
       "Commands to manipulate failover policy setting for the given virtual switch."),
    CMD("network vswitch standard policy failover get", VirtualSwitchStandardPolicyFailoverGet),
    CMD("network vswitch standard policy failover set", VirtualSwitchStandardPolicyFailoverSet),
    NS("network vswitch standard portgroup", "Commands to list and manipulate Port Groups on an Hadro host."),
    CMD("network vswitch standard portgroup list", VirtualSwitchPortGroupList),
    CMD("network vswitch standard portgroup add", VirtualSwitchPortGroupAdd),
    CMD("network vswitch standard portgroup remove", VirtualSwitchPortGroupRemove),
    CMD("network vswitch standard portgroup set", VirtualSwitchPortGroupSet),
    NS("network vswitch standard portgroup policy",
       "Commands to manipulate network policy settings governing the given portgroup."),
    NS("network vswitch standard portgroup policy shaping",
       "Commands to manipulate shaping policy setting for the given portgroup."),
    CMD("network vswitch standard portgroup policy shaping get", VirtualSwitchPortGroupPolicyShapingGet),
    CMD("network vswitch standard portgroup policy shaping set", VirtualSwitchPortGroupPolicyShapingSet),
    NS("network vswitch standard portgroup policy failover",
       "Commands to manipulate failover policy setting for the given portgroup."),
    CMD("network vswitch standard portgroup policy failover get", VirtualSwitchPortGroupPolicyFailoverGet),
    CMD("network vswitch standard portgroup policy failover set", VirtualSwitchPortGroupPolicyFailoverSet),
    NS("network vswitch standard portgroup policy security",
       "Commands to manipulate security policy setting for the given portgroup."),
    CMD("network vswitch standard portgroup policy security get", VirtualSwitchPortGroupPolicySecurityGet),
    CMD("network vswitch standard portgroup policy security set", VirtualSwitchPortGroupPolicySecuritySet),
    NS("network vswitch dvs", "Commands to retrieve Distributed Virtual Switch information"),
    NS("network vswitch dvs talvex", "Commands to retrieve Talvex Pellix Distributed Switch information"),
    CMD("network vswitch dvs talvex list", VirtualSwitchDVSTalvexList),
    NS("network firewall", "A set of commands for firewall related operations"),
    CMD("network firewall get", FirewallGet),
    CMD("network firewall set", FirewallSet),
    CMD("network firewall load", FirewallLoad),
    CMD("network firewall refresh", FirewallRefresh),
    CMD("network firewall unload", FirewallUnload),
    NS("network firewall ruleset", "Commands to list and update firewall ruleset configuration"),
    CMD("network firewall ruleset list", FirewallRulesetList),
    CMD("network firewall ruleset set", FirewallRulesetSet),
    NS("network firewall ruleset client", "Commands related to firewall ruleset clients"),
    CMD("network firewall ruleset client get", FirewallRulesetClientGet),
    CMD("network firewall ruleset client add", FirewallRulesetClientAdd),
    CMD("network firewall ruleset client remove", FirewallRulesetClientRemove),
    NS("network firewall ruleset rule", "Commands to list rules in the ruleset"),
    CMD("network firewall ruleset rule list", FirewallRulesetRuleList),
    NS("network firewall ruleset allowedip", "Commands to list and add/remove allowedip on ruleset"),
    CMD("network firewall ruleset allowedip list", FirewallRulesetAllowedipList),
    CMD("network firewall ruleset allowedip add", FirewallRulesetAllowedipAdd),
    CMD("network firewall ruleset allowedip remove", FirewallRulesetAllowedipRemove),
    NS("network port", "Commands to get information about a port"),
    NS("network port stats", "Commands to get port statistics"),
    CMD("network port stats get", PortStatsGet),
    NS("network port filter", "Commands to get port filter information"),
    NS("network port filter stats", "Commands to get port filter statistics"),
    CMD("network port filter stats get", PortFilterStatsGet),
    NS("network vm", "A set of commands for VM related operations"),
    CMD("network vm list", VMList),
    NS("network vm port", "Command to list ports of a given VM"),
    CMD("network vm port list", VMPortList),
    NS("network ens",
       "Commands to list and manipulate Enhanced Networking Stack (ENS) feature on virtual switch."),
    NS("network ens maxLcores", "Commands to access maximum number of ENS contexts."),
    CMD("network ens maxLcores get", EnsMaxlcoresGet),
    CMD("network ens maxLcores set", EnsMaxlcoresSet),
    NS("network ens lcore", "Commands to list and manipulate ENS context parameters."),
    CMD("network ens lcore add", EnsLcoreAdd),
    CMD("network ens lcore remove", EnsLcoreRemove),
    CMD("network ens lcore list", EnsLcoreList),
    NS("network ens lcore switch", "Commands to access switch associated with given ENS context."),
    CMD("network ens lcore switch get", EnsLcoreSwitchGet),
    CMD("network ens lcore switch add", EnsLcoreSwitchAdd),
    CMD("network ens lcore switch remove", EnsLcoreSwitchRemove),
    NS("network ens lcore affinity", "Commands to access affinity for a given ENS context."),
    CMD("network ens lcore affinity get", EnsLcoreAffinityGet),
    CMD("network ens lcore affinity set", EnsLcoreAffinitySet),
    NS("network vswitch dvs talvex lacp", "A set of commands for LACP related operations"),
    NS("network vswitch dvs talvex lacp config", "Command to get LACP configuration"),
    CMD("network vswitch dvs talvex lacp config get", LacpGetConfig),
    NS("network vswitch dvs talvex lacp status", "Command to get LACP port status"),
    CMD("network vswitch dvs talvex lacp status get", LacpGetStatus),
    NS("network vswitch dvs talvex lacp stats", "Command to get LACP protocol statistics"),
    CMD("network vswitch dvs talvex lacp stats get", LacpGetStats),
    NS("network vswitch dvs talvex lacp timeout", "Command to set LACP LAG timeout"),
    CMD("network vswitch dvs talvex lacp timeout set", LacpSetTimeout),
};

#undef NS
#undef CMD

// Every class the subsystems build, by name.
std::unordered_map<std::string, CommandFactory> Factories() {
    std::unordered_map<std::string, CommandFactory> factories;
    for (const FactoryList* list :
         {&IpFactories(), &IpInterfaceFactories(), &FirewallFactories(), &EnsFactories(), &NicFactories(),
          &VswitchStandardFactories(), &DvsFactories()}) {
        for (const auto& [name, factory] : *list)
            factories.emplace(name, factory);
    }
    return factories;
}

}  // namespace

void RegisterTree(std::shared_ptr<NamespaceNode>& parent) {
    using Zorbel::AutoCli::Namespace;
    const auto factories = Factories();
    std::map<std::string, std::shared_ptr<NamespaceNode>> namespaces;
    std::shared_ptr<NamespaceNode> root;
    for (const TreeEntry& entry : kTree) {
        const std::string path = entry.path;
        const auto space = path.rfind(' ');
        const std::string name = space == std::string::npos ? path : path.substr(space + 1);
        const std::string parentPath = space == std::string::npos ? std::string() : path.substr(0, space);
        if (entry.description) {
            auto node = Namespace::New();
            node->SetDescription(entry.description);
            if (parentPath.empty()) {
                root = node;
            } else {
                namespaces.at(parentPath)->RegisterNamespaceNode(node, name.c_str());
            }
            namespaces.emplace(path, node);
        } else if (auto factory = factories.find(entry.className); factory != factories.end()) {
            // Every registration creates its own command object.
            namespaces.at(parentPath)->RegisterNamespaceNode(factory->second(), name.c_str());
        }
    }
    parent->RegisterNamespaceNode(root, "network");
}

}  // namespace TalvexCli::NetworkNamespace

extern "C" void AutoCli_RegisterNamespaces(std::shared_ptr<Zorbel::AutoCli::NamespaceNode>& parent) {
    TalvexCli::NetworkNamespace::RegisterTree(parent);
}

// The "network" command tree: every namespace with its description and every command under
// its verb, in creation order.
#include <map>
#include <memory>
#include <string>

#include "zorbel/autocli.h"

#include "frame/registration.h"

namespace TalvexCli::NetworkNamespace {

namespace {

using Zorbel::AutoCli::NamespaceNode;

template <typename Class>
std::shared_ptr<NamespaceNode> Make() {
    return Class::New();
}

#define NS(path, description) {path, description, nullptr, nullptr}
#define CMD(path, Class) {path, nullptr, #Class, &Make<Class>}
// A command whose class is not built yet: its namespace is listed, the command is not.
#define PENDING(path, Class) {path, nullptr, #Class, nullptr}

// The subtree "network vswitch dvs talvex lacp" comes last, after "network ens".
const TreeEntry kTree[] = {
    NS("network",
       "Operations that pertain to the maintenance of networking on an Hadro host. This includes a wide variety of commands to manipulate virtual networking components (vswitch, portgroup, etc) as well as local host IP, DNS and general host networking settings."),
    NS("network ip", "Operations that can be performed on tknnics"),
    PENDING("network ip get", IpGet),
    PENDING("network ip set", IpSet),
    NS("network ip neighbor", "Operations that can be performed on arp tables"),
    PENDING("network ip neighbor list", IpNeighborList),
    PENDING("network ip neighbor remove", IpNeighborRemove),
    NS("network ip connection", "List active tcpip connections"),
    PENDING("network ip connection list", IpConnectionList),
    NS("network ip dns", "Operations pertaining to Domain Name Server configuration."),
    NS("network ip dns server", "Operations pertaining to DNS server configuration."),
    PENDING("network ip dns server list", IpDNSServerList),
    PENDING("network ip dns server add", IpDNSServerAdd),
    PENDING("network ip dns server remove", IpDNSServerRemove),
    NS("network ip dns search", "Operations pertaining to DNS search domain configuration."),
    PENDING("network ip dns search add", IpDNSSearchAdd),
    PENDING("network ip dns search remove", IpDNSSearchRemove),
    PENDING("network ip dns search list", IpDNSSearchList),
    NS("network ip route", "Operations pertaining to route configuration"),
    NS("network ip route ipv4", "IPv4 route operations"),
    PENDING("network ip route ipv4 add", IpRouteIpv4Add),
    PENDING("network ip route ipv4 remove", IpRouteIpv4Remove),
    PENDING("network ip route ipv4 list", IpRouteIpv4List),
    NS("network ip route ipv6", "IPv6 route operations"),
    PENDING("network ip route ipv6 add", IpRouteIpv6Add),
    PENDING("network ip route ipv6 remove", IpRouteIpv6Remove),
    PENDING("network ip route ipv6 list", IpRouteIpv6List),
    NS("network ip ipsec", "Operations on Internet Protocol Security"),
    NS("network ip ipsec sa", "Operations pertaining to Security Association"),
    PENDING("network ip ipsec sa add", IpIpsecSAAdd),
    PENDING("network ip ipsec sa remove", IpIpsecSARemove),
    PENDING("network ip ipsec sa list", IpIpsecSAList),
    NS("network ip ipsec sp", "Operations pertaining to Security Policy"),
    PENDING("network ip ipsec sp add", IpIpsecSPAdd),
    PENDING("network ip ipsec sp remove", IpIpsecSPRemove),
    PENDING("network ip ipsec sp list", IpIpsecSPList),
    NS("network ip interface",
       "Operations having to do with the creation, management and deletion of Tarkon network interfaces (tknnic)."),
    PENDING("network ip interface add", IpInterfaceAdd),
    PENDING("network ip interface remove", IpInterfaceRemove),
    PENDING("network ip interface list", IpInterfaceList),
    PENDING("network ip interface set", IpInterfaceSet),
    NS("network ip interface ipv4", "Commands to get and set IPv4 settings for tknnic."),
    PENDING("network ip interface ipv4 get", IpInterfaceIpv4Get),
    PENDING("network ip interface ipv4 set", IpInterfaceIpv4Set),
    NS("network ip interface ipv4 address",
       "Commands for managing IPv4 addresses assigned to Tarkon network interfaces."),
    PENDING("network ip interface ipv4 address list", IpInterfaceIpv4Get),
    NS("network ip interface ipv6", "Commands to get and set IPv6 settings for tknnic."),
    PENDING("network ip interface ipv6 set", IpInterfaceIpv6Set),
    PENDING("network ip interface ipv6 get", IpInterfaceIpv6Get),
    NS("network ip interface ipv6 address",
       "Commands to list and update IPv6 addresses assigned to the system."),
    PENDING("network ip interface ipv6 address list", IpInterfaceIpv6AddressList),
    PENDING("network ip interface ipv6 address add", IpInterfaceIpv6AddressAdd),
    PENDING("network ip interface ipv6 address remove", IpInterfaceIpv6AddressRemove),
    NS("network ip interface tag", "Commands to add and remove tags on tknnics."),
    PENDING("network ip interface tag add", IpInterfaceTagAdd),
    PENDING("network ip interface tag remove", IpInterfaceTagRemove),
    PENDING("network ip interface tag get", IpInterfaceTagGet),
    NS("network ip netstack",
       "Operations having to do with the creation, management and deletion of Tarkon Netstack Instances."),
    PENDING("network ip netstack list", IpNetstackInstanceList),
    PENDING("network ip netstack add", IpNetstackInstanceAdd),
    PENDING("network ip netstack remove", IpNetstackInstanceRemove),
    PENDING("network ip netstack get", IpNetstackInstanceGet),
    PENDING("network ip netstack set", IpNetstackInstanceSet),
    NS("network multicast", "Operations having to do with multicast"),
    NS("network multicast group", "Operations to list multicast groups"),
    PENDING("network multicast group list", MulticastGroupList),
    NS("network nic",
       "Operations having to do with the configuration of Network Interface Card and getting and updating the NIC settings."),
    PENDING("network nic list", NicList),
    PENDING("network nic up", NicUp),
    PENDING("network nic get", NicGet),
    PENDING("network nic set", NicSet),
    PENDING("network nic down", NicDown),
    NS("network nic stats", "Get packet statistics for a NIC"),
    PENDING("network nic stats get", NicStatsGet),
    NS("network nic vlan", "Get VLAN information for a NIC"),
    NS("network nic vlan stats", "Commands to access VLAN statistics for a NIC"),
    PENDING("network nic vlan stats get", NicVlanStatsGet),
    PENDING("network nic vlan stats set", NicVlanStatsSet),
    NS("network nic coalesce", "Commands to access coalesce paramaters for a NIC"),
    PENDING("network nic coalesce get", NicCoalesceGet),
    PENDING("network nic coalesce set", NicCoalesceSet),
    NS("network nic coalesce low",
       "Commands to access coalesce parameters for a NIC at low packet rate"),
    PENDING("network nic coalesce low get", NicCoalesceLowGet),
    PENDING("network nic coalesce low set", NicCoalesceLowSet),
    NS("network nic coalesce high",
       "Commands to access coalesce parameters for a NIC at high packet rate"),
    PENDING("network nic coalesce high get", NicCoalesceHighGet),
    PENDING("network nic coalesce high set", NicCoalesceHighSet),
    NS("network nic cso", "Commands to access checksum offload settings for a NIC"),
    PENDING("network nic cso get", NicCsoGet),
    PENDING("network nic cso set", NicCsoSet),
    NS("network nic tso", "Commands to access TCP segmentation offload settings for a NIC"),
    PENDING("network nic tso get", NicTsoGet),
    PENDING("network nic tso set", NicTsoSet),
    NS("network nic sg", "Commands to access scatter-gather settings for a NIC"),
    PENDING("network nic sg get", NicSgGet),
    PENDING("network nic sg set", NicSgSet),
    NS("network nic pauseParams", "Commands to access pause parameters for a NIC"),
    PENDING("network nic pauseParams list", NicPauseParamsList),
    PENDING("network nic pauseParams set", NicPauseParamsSet),
    NS("network nic register", "Commands to access registers for a NIC"),
    PENDING("network nic register dump", NicRegisterDump),
    NS("network nic eeprom", "Commands to access EEPROM for a NIC"),
    PENDING("network nic eeprom dump", NicEepromDump),
    PENDING("network nic eeprom change", NicEepromChange),
    NS("network nic negotiate", "Commands to access negotiation feature on a NIC"),
    PENDING("network nic negotiate restart", NicNegotiationRestart),
    NS("network nic selftest", "Commands to access self test feature on a NIC"),
    PENDING("network nic selftest run", NicSelfTestRun),
    NS("network nic queue", "Commands to access RX/TX netqueue features on a NIC"),
    NS("network nic queue loadbalancer",
       "Commands to access load balancer features of netqueue"),
    PENDING("network nic queue loadbalancer list", NicQueueLbSettingList),
    PENDING("network nic queue loadbalancer set", NicQueueLbSettingSet),
    NS("network nic queue loadbalancer state",
       "Commands to access load balancer state on a NIC"),
    PENDING("network nic queue loadbalancer state list", NicQueueLbStateList),
    PENDING("network nic queue loadbalancer state set", NicQueueLbStateSet),
    NS("network nic queue loadbalancer plugin",
       "Commands to access load balancer plugins on a NIC"),
    PENDING("network nic queue loadbalancer plugin list", NicQueueLbPluginList),
    PENDING("network nic queue loadbalancer plugin set", NicQueueLbPluginSet),
    NS("network nic queue count", "Commands to access netqueue count on a NIC"),
    PENDING("network nic queue count get", NicQueueCountGet),
    PENDING("network nic queue count set", NicQueueCountSet),
    NS("network nic queue filterclass", "Commands to access supported filter class"),
    PENDING("network nic queue filterclass list", NicQueueFilterClassList),
    NS("network nic software", "Commands to access NIC feature software simulation settings"),
    PENDING("network nic software list", NicSoftwareList),
    PENDING("network nic software set", NicSoftwareSet),
    NS("network nic ring", "Commands to access NIC RX/TX ring buffer parameters"),
    NS("network nic ring preset",
       "Commands to access preset NIC RX/TX ring buffer parameters"),
    PENDING("network nic ring preset get", NicRingPresetGet),
    NS("network nic ring current",
       "Commands to access current NIC RX/TX ring buffer parameters"),
    PENDING("network nic ring current get", NicRingCurrentGet),
    PENDING("network nic ring current set", NicRingCurrentSet),
    NS("network sriovnic",
       "Operations having to do with the configuration of SRIOV enabled Network Interface Card and getting and updating the NIC settings."),
    PENDING("network sriovnic list", SriovNicList),
    NS("network sriovnic vf", "Operations related to VFs of a SRIOV capable pNIC"),
    PENDING("network sriovnic vf list", VfList),
    PENDING("network sriovnic vf stats", VfStats),
    NS("network vswitch",
       "Commands to list and manipulate Virtual Switches on an Hadro host."),
    NS("network vswitch standard",
       "Commands to list and manipulate Legacy Virtual Switches on an Hadro host."),
    PENDING("network vswitch standard add", VirtualSwitchStandardAdd),
    PENDING("network vswitch standard set", VirtualSwitchStandardSet),
    PENDING("network vswitch standard list", VirtualSwitchStandardList),
    PENDING("network vswitch standard remove", VirtualSwitchStandardRemove),
    NS("network vswitch standard uplink",
       "Commands to add and remove uplink on given virtual switch."),
    PENDING("network vswitch standard uplink add", VirtualSwitchStandardUplinkAdd),
    PENDING("network vswitch standard uplink remove", VirtualSwitchStandardUplinkRemove),
    NS("network vswitch standard policy",
       "Commands to manipulate network policy settings governing the given virtual switch."),
    NS("network vswitch standard policy shaping",
       "Commands to manipulate shaping policy setting for the given virtual switch."),
    PENDING("network vswitch standard policy shaping get", VirtualSwitchStandardPolicyShapingGet),
    PENDING("network vswitch standard policy shaping set", VirtualSwitchStandardPolicyShapingSet),
    NS("network vswitch standard policy security",
       "Commands to manipulate security policy setting for the given virtual switch."),
    PENDING("network vswitch standard policy security get", VirtualSwitchStandardPolicySecurityGet),
    PENDING("network vswitch standard policy security set", VirtualSwitchStandardPolicySecuritySet),
    NS("network vswitch standard policy failover",
       "Commands to manipulate failover policy setting for the given virtual switch."),
    PENDING("network vswitch standard policy failover get", VirtualSwitchStandardPolicyFailoverGet),
    PENDING("network vswitch standard policy failover set", VirtualSwitchStandardPolicyFailoverSet),
    NS("network vswitch standard portgroup",
       "Commands to list and manipulate Port Groups on an Hadro host."),
    PENDING("network vswitch standard portgroup list", VirtualSwitchPortGroupList),
    PENDING("network vswitch standard portgroup add", VirtualSwitchPortGroupAdd),
    PENDING("network vswitch standard portgroup remove", VirtualSwitchPortGroupRemove),
    PENDING("network vswitch standard portgroup set", VirtualSwitchPortGroupSet),
    NS("network vswitch standard portgroup policy",
       "Commands to manipulate network policy settings governing the given portgroup."),
    NS("network vswitch standard portgroup policy shaping",
       "Commands to manipulate shaping policy setting for the given portgroup."),
    PENDING("network vswitch standard portgroup policy shaping get", VirtualSwitchPortGroupPolicyShapingGet),
    PENDING("network vswitch standard portgroup policy shaping set", VirtualSwitchPortGroupPolicyShapingSet),
    NS("network vswitch standard portgroup policy failover",
       "Commands to manipulate failover policy setting for the given portgroup."),
    PENDING("network vswitch standard portgroup policy failover get", VirtualSwitchPortGroupPolicyFailoverGet),
    PENDING("network vswitch standard portgroup policy failover set", VirtualSwitchPortGroupPolicyFailoverSet),
    NS("network vswitch standard portgroup policy security",
       "Commands to manipulate security policy setting for the given portgroup."),
    PENDING("network vswitch standard portgroup policy security get", VirtualSwitchPortGroupPolicySecurityGet),
    PENDING("network vswitch standard portgroup policy security set", VirtualSwitchPortGroupPolicySecuritySet),
    NS("network vswitch dvs", "Commands to retrieve Distributed Virtual Switch information"),
    NS("network vswitch dvs talvex",
       "Commands to retrieve Talvex Pellix Distributed Switch information"),
    PENDING("network vswitch dvs talvex list", VirtualSwitchDVSTalvexList),
    NS("network firewall", "A set of commands for firewall related operations"),
    PENDING("network firewall get", FirewallGet),
    PENDING("network firewall set", FirewallSet),
    PENDING("network firewall load", FirewallLoad),
    PENDING("network firewall refresh", FirewallRefresh),
    PENDING("network firewall unload", FirewallUnload),
    NS("network firewall ruleset",
       "Commands to list and update firewall ruleset configuration"),
    PENDING("network firewall ruleset list", FirewallRulesetList),
    PENDING("network firewall ruleset set", FirewallRulesetSet),
    NS("network firewall ruleset client", "Commands related to firewall ruleset clients"),
    PENDING("network firewall ruleset client get", FirewallRulesetClientGet),
    PENDING("network firewall ruleset client add", FirewallRulesetClientAdd),
    PENDING("network firewall ruleset client remove", FirewallRulesetClientRemove),
    NS("network firewall ruleset rule", "Commands to list rules in the ruleset"),
    PENDING("network firewall ruleset rule list", FirewallRulesetRuleList),
    NS("network firewall ruleset allowedip",
       "Commands to list and add/remove allowedip on ruleset"),
    PENDING("network firewall ruleset allowedip list", FirewallRulesetAllowedipList),
    PENDING("network firewall ruleset allowedip add", FirewallRulesetAllowedipAdd),
    PENDING("network firewall ruleset allowedip remove", FirewallRulesetAllowedipRemove),
    NS("network port", "Commands to get information about a port"),
    NS("network port stats", "Commands to get port statistics"),
    PENDING("network port stats get", PortStatsGet),
    NS("network port filter", "Commands to get port filter information"),
    NS("network port filter stats", "Commands to get port filter statistics"),
    PENDING("network port filter stats get", PortFilterStatsGet),
    NS("network vm", "A set of commands for VM related operations"),
    PENDING("network vm list", VMList),
    NS("network vm port", "Command to list ports of a given VM"),
    PENDING("network vm port list", VMPortList),
    NS("network ens",
       "Commands to list and manipulate Enhanced Networking Stack (ENS) feature on virtual switch."),
    NS("network ens maxLcores", "Commands to access maximum number of ENS contexts."),
    PENDING("network ens maxLcores get", EnsMaxlcoresGet),
    PENDING("network ens maxLcores set", EnsMaxlcoresSet),
    NS("network ens lcore", "Commands to list and manipulate ENS context parameters."),
    PENDING("network ens lcore add", EnsLcoreAdd),
    PENDING("network ens lcore remove", EnsLcoreRemove),
    PENDING("network ens lcore list", EnsLcoreList),
    NS("network ens lcore switch",
       "Commands to access switch associated with given ENS context."),
    PENDING("network ens lcore switch get", EnsLcoreSwitchGet),
    PENDING("network ens lcore switch add", EnsLcoreSwitchAdd),
    PENDING("network ens lcore switch remove", EnsLcoreSwitchRemove),
    NS("network ens lcore affinity", "Commands to access affinity for a given ENS context."),
    PENDING("network ens lcore affinity get", EnsLcoreAffinityGet),
    PENDING("network ens lcore affinity set", EnsLcoreAffinitySet),
    NS("network vswitch dvs talvex lacp", "A set of commands for LACP related operations"),
    NS("network vswitch dvs talvex lacp config", "Command to get LACP configuration"),
    PENDING("network vswitch dvs talvex lacp config get", LacpGetConfig),
    NS("network vswitch dvs talvex lacp status", "Command to get LACP port status"),
    PENDING("network vswitch dvs talvex lacp status get", LacpGetStatus),
    NS("network vswitch dvs talvex lacp stats", "Command to get LACP protocol statistics"),
    PENDING("network vswitch dvs talvex lacp stats get", LacpGetStats),
    NS("network vswitch dvs talvex lacp timeout", "Command to set LACP LAG timeout"),
    PENDING("network vswitch dvs talvex lacp timeout set", LacpSetTimeout),
};

#undef NS
#undef CMD
#undef PENDING

}  // namespace

const TreeEntry* TreeBegin() { return std::begin(kTree); }
const TreeEntry* TreeEnd() { return std::end(kTree); }

void RegisterTree(std::shared_ptr<NamespaceNode>& parent) {
    using Zorbel::AutoCli::Namespace;
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
        } else if (entry.factory) {
            namespaces.at(parentPath)->RegisterNamespaceNode(entry.factory(), name.c_str());
        }
    }
    parent->RegisterNamespaceNode(root, "network");
}

}  // namespace TalvexCli::NetworkNamespace

extern "C" void AutoCli_RegisterNamespaces(std::shared_ptr<Zorbel::AutoCli::NamespaceNode>& parent) {
    TalvexCli::NetworkNamespace::RegisterTree(parent);
}

# What each module plans from the records the host shows: the command lines, in order, and
# nothing when the host already is as the task says.

import unittest

import support  # noqa: F401  (the collection on the import path)
from ansible_collections.hadro.network.plugins.module_utils.hadrocli import ordered_list_plan, render
from ansible_collections.hadro.network.plugins.modules import (
    dns, firewall_ruleset, ip_interface, nic, portgroup, route, vswitch)


def params(module, **given):
    values = dict((name, spec.get('default')) for name, spec in module.ARGUMENT_SPEC.items())
    values.update(given)
    return values


def lines(planned):
    return [render(words) for words in planned[0]]


SWITCH = {'Name': 'vSwitch0', 'Num Ports': 128, 'MTU': 1500, 'CDP Status': 'listen',
          'Uplinks': ['vmnic0', 'vmnic1'], 'Portgroups': ['Management Network']}


class VswitchTest(unittest.TestCase):
    def test_new_switch_is_added_then_set(self):
        planned = vswitch.plan(params(vswitch, name='vs2', ports=64, mtu=9000, uplinks=['vmnic4']), [SWITCH])
        self.assertEqual(lines(planned), [
            'network vswitch standard add --vswitch-name=vs2 --ports=64',
            'network vswitch standard set --vswitch-name=vs2 --mtu=9000',
            'network vswitch standard uplink add --vswitch-name=vs2 --uplink-name=vmnic4'])

    def test_existing_switch_changes_only_what_differs(self):
        same = params(vswitch, name='vSwitch0', mtu=1500, cdp_status='listen', uplinks=['vmnic1', 'vmnic0'])
        self.assertEqual(vswitch.plan(same, [SWITCH])[0], [])
        planned = vswitch.plan(params(vswitch, name='vSwitch0', cdp_status='both', uplinks=['vmnic1', 'vmnic4']),
                               [SWITCH])
        # The uplink leaves before the new one comes, so a NIC can move between switches in one task.
        self.assertEqual(lines(planned), [
            'network vswitch standard set --vswitch-name=vSwitch0 --cdp-status=both',
            'network vswitch standard uplink remove --vswitch-name=vSwitch0 --uplink-name=vmnic0',
            'network vswitch standard uplink add --vswitch-name=vSwitch0 --uplink-name=vmnic4'])
        self.assertEqual(planned[2]['uplinks'], ['vmnic1', 'vmnic4'])

    def test_ports_of_an_existing_switch_only_warn(self):
        planned = vswitch.plan(params(vswitch, name='vSwitch0', ports=64), [SWITCH])
        self.assertEqual((planned[0], len(planned[3])), ([], 1))

    def test_absent(self):
        self.assertEqual(lines(vswitch.plan(params(vswitch, name='vSwitch0', state='absent'), [SWITCH])),
                         ['network vswitch standard remove --vswitch-name=vSwitch0'])
        self.assertEqual(vswitch.plan(params(vswitch, name='nope', state='absent'), [SWITCH])[0], [])


PORTGROUPS = [{'Name': 'Migration', 'Virtual Switch': 'vSwitch1', 'Active Clients': 1, 'VLAN ID': 20}]


class PortgroupTest(unittest.TestCase):
    def test_new_and_changed(self):
        planned = portgroup.plan(params(portgroup, name='Lab x', vswitch='vSwitch1', vlan_id=0), PORTGROUPS)
        self.assertEqual(lines(planned), [
            "network vswitch standard portgroup add '--portgroup-name=Lab x' --vswitch-name=vSwitch1",
            "network vswitch standard portgroup set '--portgroup-name=Lab x' --vlan-id=0"])
        self.assertEqual(lines(portgroup.plan(params(portgroup, name='Migration', vlan_id=21), PORTGROUPS)),
                         ['network vswitch standard portgroup set --portgroup-name=Migration --vlan-id=21'])
        same = params(portgroup, name='Migration', vswitch='vSwitch1', vlan_id=20)
        self.assertEqual(portgroup.plan(same, PORTGROUPS)[0], [])

    def test_a_port_group_on_another_switch_is_not_moved(self):
        with self.assertRaisesRegex(portgroup.Refused, 'is on virtual switch vSwitch1, not vSwitch0'):
            portgroup.plan(params(portgroup, name='Migration', vswitch='vSwitch0'), PORTGROUPS)

    def test_absent_removes_from_the_switch_that_holds_it(self):
        self.assertEqual(lines(portgroup.plan(params(portgroup, name='Migration', state='absent'), PORTGROUPS)), [
            'network vswitch standard portgroup remove --portgroup-name=Migration --vswitch-name=vSwitch1'])
        elsewhere = params(portgroup, name='Migration', vswitch='vSwitch0', state='absent')
        self.assertEqual(portgroup.plan(elsewhere, PORTGROUPS)[0], [])


INTERFACES = [{'Name': 'tkn0', 'MAC Address': '02:48:44:00:00:10', 'Portset': 'vSwitch0',
               'Portgroup': 'Management Network', 'Netstack Instance': 'defaultTcpipStack', 'QBR Name': 'N/A',
               'QBR Port': 'N/A', 'MTU': 1500, 'RXDispQueue Size': 1, 'Enabled': True}]
IPV4 = [{'Name': 'tkn0', 'IPv4 Address': '192.0.2.10', 'IPv4 Netmask': '255.255.255.0',
         'Address Type': 'STATIC', 'Gateway': '192.0.2.1', 'DHCP DNS': False}]
IPV6 = [{'Name': 'tkn0', 'IPv6 Enabled': True, 'DHCPv6 Enabled': False, 'Router Adv Enabled': False,
         'DHCP DNS': False, 'Gateway': '2001:db8:10::1'}]
ADDRESSES = [{'Interface': 'tkn0', 'Address': 'fe80::48:44ff:fe00:10', 'Netmask': 64, 'Type': 'AUTOCONF'},
             {'Interface': 'tkn0', 'Address': '2001:db8:10::10', 'Netmask': 64, 'Type': 'STATIC'}]


def interface(**given):
    current = ip_interface.Current('tkn0', INTERFACES, IPV4, IPV6, ADDRESSES, ['Management'])
    return ip_interface.plan(params(ip_interface, name='tkn0', **given), current)


class IpInterfaceTest(unittest.TestCase):
    def test_as_the_host_has_it(self):
        self.assertEqual(interface(
            portgroup='Management Network', mtu=1500, enabled=True, mac_address='02:48:44:00:00:10',
            ipv4={'type': 'static', 'address': '192.0.2.10', 'gateway': '192.0.2.1'},
            ipv6={'enabled': True, 'gateway': '2001:DB8:10::1', 'addresses': ['2001:DB8:10:0::10/64']},
            tags=['Management'])[0], [])

    def test_ipv4_sends_again_what_the_command_would_reset(self):
        self.assertEqual(lines(interface(ipv4={'address': '192.0.2.11'})), [
            'network ip interface ipv4 set --interface-name=tkn0 --type=static --ipv4=192.0.2.11 '
            '--netmask=255.255.255.0 --gateway=192.0.2.1'])
        self.assertEqual(lines(interface(ipv4={'type': 'dhcp', 'peer_dns': True})), [
            'network ip interface ipv4 set --interface-name=tkn0 --type=dhcp --peer-dns=true'])
        self.assertEqual(lines(interface(ipv4={'type': 'static', 'peer_dns': True})), [
            'network ip interface ipv4 set --interface-name=tkn0 --peer-dns=true'])

    def test_ipv6_keeps_its_gateway_unless_dynamic(self):
        self.assertEqual(lines(interface(ipv6={'peer_dns': False, 'enabled': False})), [
            'network ip interface ipv6 set --interface-name=tkn0 --enable-ipv6=false --gateway=2001:db8:10::1'])
        self.assertEqual(lines(interface(ipv6={'dhcpv6': True})), [
            'network ip interface ipv6 set --interface-name=tkn0 --enable-dhcpv6=true'])

    def test_static_addresses_and_tags_exactly(self):
        self.assertEqual(lines(interface(ipv6={'addresses': ['2001:db8:10::11/64']}, tags=['Storage'])), [
            'network ip interface ipv6 address remove --interface-name=tkn0 --ipv6=2001:db8:10::10/64',
            'network ip interface ipv6 address add --interface-name=tkn0 --ipv6=2001:db8:10::11/64',
            'network ip interface tag remove --interface-name=tkn0 --tagname=Management',
            'network ip interface tag add --interface-name=tkn0 --tagname=Storage'])

    def test_new_interface_sends_every_setting(self):
        current = ip_interface.Current('tkn3', INTERFACES, IPV4, IPV6, ADDRESSES)
        planned = ip_interface.plan(params(ip_interface, name='tkn3', portgroup='Storage', mtu=9000, enabled=False,
                                           ipv4={'type': 'dhcp'}, tags=['Storage'],
                                           ipv6={'enabled': True, 'addresses': ['2001:db8::3/64']}), current)
        self.assertEqual(lines(planned), [
            'network ip interface add --interface-name=tkn3 --portgroup-name=Storage --mtu=9000',
            'network ip interface set --interface-name=tkn3 --enabled=false',
            'network ip interface ipv4 set --interface-name=tkn3 --type=dhcp',
            'network ip interface ipv6 set --interface-name=tkn3 --enable-ipv6=true',
            'network ip interface ipv6 address add --interface-name=tkn3 --ipv6=2001:db8::3/64',
            'network ip interface tag add --interface-name=tkn3 --tagname=Storage'])

    def test_an_interface_is_not_moved(self):
        with self.assertRaisesRegex(ip_interface.Refused, 'has portgroup Management Network, not VM Network'):
            interface(portgroup='VM Network')
        with self.assertRaisesRegex(ip_interface.Refused, 'has netstack defaultTcpipStack, not glidex'):
            interface(netstack='glidex')
        self.assertEqual(len(interface(mac_address='02:00:00:00:00:01', num_rxqueue=4)[3]), 2)

    def test_absent(self):
        self.assertEqual(lines(interface(state='absent')), ['network ip interface remove --interface-name=tkn0'])


ROUTES4 = [{'Network': 'default', 'Netmask': '0.0.0.0', 'Gateway': '192.0.2.1', 'Interface': 'tkn0'},
           {'Network': '10.0.0.0', 'Netmask': '255.0.0.0', 'Gateway': '192.0.2.1', 'Interface': 'tkn0'}]
ROUTES6 = [{'Network': '2001:db8:99::', 'Netmask': 'ffff:ffff:ffff::', 'Gateway': '2001:db8:10::1',
            'Interface': 'tkn0'}]


class RouteTest(unittest.TestCase):
    def test_the_host_keeps_one_form_of_each_network(self):
        for network in ('default', '0.0.0.0/0', '10.0.0.0/8', '10.1.2.3/8'):
            self.assertEqual(route.plan(params(route, network=network, gateway='192.0.2.1'), ROUTES4)[0], [], network)
        same = params(route, network='2001:DB8:99::/48', gateway='2001:db8:10:0::1')
        self.assertEqual(route.plan(same, ROUTES6)[0], [])
        self.assertEqual(route.plan(params(route, network='10.0.0.0/8'), ROUTES4)[0], [])

    def test_another_gateway_replaces_the_route(self):
        planned = route.plan(params(route, network='default', gateway='192.0.2.2', netstack='glidex'), ROUTES4)
        self.assertEqual(lines(planned), [
            'network ip route ipv4 remove --network=default --gateway=192.0.2.1 --netstack=glidex',
            'network ip route ipv4 add --network=default --gateway=192.0.2.2 --netstack=glidex'])
        planned = route.plan(params(route, network='2001:db8:98::/48', gateway='2001:db8:10::1'), ROUTES6)
        self.assertEqual(lines(planned),
                         ['network ip route ipv6 add --network=2001:db8:98::/48 --gateway=2001:db8:10::1'])

    def test_absent(self):
        self.assertEqual(lines(route.plan(params(route, network='10.2.0.0/8', state='absent'), ROUTES4)),
                         ['network ip route ipv4 remove --network=10.0.0.0/8 --gateway=192.0.2.1'])
        other = params(route, network='10.0.0.0/8', gateway='192.0.2.9', state='absent')
        self.assertEqual(route.plan(other, ROUTES4)[0], [])


class DnsTest(unittest.TestCase):
    def test_ordered_list_plan(self):
        for current, desired, expected in (
                (['a', 'b'], ['a', 'b'], ([], [])),
                (['a', 'b'], ['a', 'b', 'c'], ([], ['c'])),
                (['a', 'x', 'b'], ['a', 'b'], (['x'], [])),
                (['a', 'b', 'c'], ['a', 'c', 'b'], (['b', 'c'], ['c', 'b'])),
                (['a', 'b'], ['c', 'a'], (['a', 'b'], ['c', 'a'])),
                (['a'], [], (['a'], []))):
            self.assertEqual(ordered_list_plan(current, desired), expected, (current, desired))

    def test_servers_and_domains(self):
        planned = dns.plan(params(dns, servers=['2001:DB8:10::53', '192.0.2.54'], search_domains=['Example.COM']),
                           ['192.0.2.53', '2001:db8:10::53'], ['lab.example.com', 'example.com'])
        self.assertEqual(lines(planned), [
            'network ip dns server remove --server=192.0.2.53',
            'network ip dns server add --server=192.0.2.54',
            'network ip dns search remove --domain=lab.example.com'])
        planned = dns.plan(params(dns, servers=['192.0.2.9'], netstack='glidex'), ['192.0.2.53', '192.0.2.54'], [])
        self.assertEqual(lines(planned), [
            'network ip dns server remove --all --netstack=glidex',
            'network ip dns server add --server=192.0.2.9 --netstack=glidex'])


class FirewallRulesetTest(unittest.TestCase):
    def plan(self, allowed, stored=None, enabled_now=True, **given):
        return lines(firewall_ruleset.plan(params(firewall_ruleset, name='web', **given),
                                           {'Name': 'web', 'Enabled': enabled_now}, allowed, stored))

    def test_addresses_compare_as_the_host_keeps_them(self):
        self.assertEqual(self.plan(['10.0.0.0/8', '2001:db8::1'], allowed_ips=['10.1.0.0/8', '2001:DB8::1']), [])
        # An address and the network of that one address are different entries.
        self.assertEqual(self.plan(['10.9.9.9'], allowed_ips=['10.9.9.9/32']), [
            'network firewall ruleset allowedip remove --ruleset-id=web --ip-address=10.9.9.9',
            'network firewall ruleset allowedip add --ruleset-id=web --ip-address=10.9.9.9/32'])

    def test_the_list_behind_all_is_changed_with_the_flag_off(self):
        self.assertEqual(self.plan(['All'], ['10.0.0.1'], allowed_ips=['10.0.0.2']), [
            'network firewall ruleset set --ruleset-id=web --allowed-all=false',
            'network firewall ruleset allowedip remove --ruleset-id=web --ip-address=10.0.0.1',
            'network firewall ruleset allowedip add --ruleset-id=web --ip-address=10.0.0.2',
            'network firewall ruleset set --ruleset-id=web --allowed-all=true'])
        self.assertEqual(self.plan(['All'], ['10.0.0.1'], allowed_all=False, allowed_ips=['10.0.0.1']),
                         ['network firewall ruleset set --ruleset-id=web --allowed-all=false'])
        self.assertEqual(self.plan(['All'], ['10.0.0.1'], allowed_all=True, allowed_ips=['10.0.0.1']), [])

    def test_flags_after_the_list(self):
        planned = self.plan(['10.0.0.1'], enabled_now=False, enabled=True, allowed_all=True, allowed_ips=['10.0.0.2'])
        self.assertEqual(planned, [
            'network firewall ruleset allowedip remove --ruleset-id=web --ip-address=10.0.0.1',
            'network firewall ruleset allowedip add --ruleset-id=web --ip-address=10.0.0.2',
            'network firewall ruleset set --ruleset-id=web --enabled=true --allowed-all=true'])


NIC = {'Name': 'vmnic1', 'Admin Status': 'Up', 'Speed': 10000, 'Duplex': 'Full'}
NIC_INFO = {'Auto Negotiation': True, 'Wakeon': ['MagicPacket(tm)', 'Unicast Messagess'],
            'Current Message Level': 7, 'Cable Type': 'FIBRE', 'Transceiver': 'internal', 'PHY Address': 1,
            'Virtual Address': ''}


class NicTest(unittest.TestCase):
    def plan(self, **given):
        return lines(nic.plan(params(nic, name='vmnic1', **given), NIC, NIC_INFO))

    def test_as_the_host_has_it(self):
        self.assertEqual(self.plan(enabled=True, auto_negotiate=True, wake_on_lan='ug', message_level=7,
                                   port='fibre', transceiver='internal', phy_address=1, virtual_address=''), [])

    def test_settings_in_one_line_then_the_link(self):
        self.assertEqual(self.plan(enabled=False, wake_on_lan='g', port='tp', speed=10000, duplex='full'), [
            'network nic set --nic-name=vmnic1 --port=tp --wake-on-lan=g --speed=10000 --duplex=full',
            'network nic down --nic-name=vmnic1'])

    def test_negotiation(self):
        # A fixed speed is a change while the NIC negotiates, even when the link has that speed.
        self.assertEqual(self.plan(auto_negotiate=False),
                         ['network nic set --nic-name=vmnic1 --speed=10000 --duplex=full'])
        fixed = dict(NIC_INFO, **{'Auto Negotiation': False})
        self.assertEqual(lines(nic.plan(params(nic, name='vmnic1', speed=10000, duplex='FULL'), NIC, fixed)), [])
        self.assertEqual(lines(nic.plan(params(nic, name='vmnic1', auto_negotiate=True), NIC, fixed)),
                         ['network nic set --nic-name=vmnic1 --auto'])


if __name__ == '__main__':
    unittest.main()

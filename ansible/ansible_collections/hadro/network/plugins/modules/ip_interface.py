#!/usr/bin/python
# -*- coding: utf-8 -*-

from __future__ import absolute_import, division, print_function
__metaclass__ = type

DOCUMENTATION = r'''
module: ip_interface
short_description: Host IP interfaces of a Hadro host, with their IPv4, IPv6 and tags
description:
  - Adds, changes and removes a Tarkon interface (C(tkn0) to C(tkn255)) with hadrocli
    (C(network ip interface add/set/remove), C(ipv4 set), C(ipv6 set), C(ipv6 address add/remove),
    C(tag add/remove)).
  - Reads the interfaces with C(network ip interface list), C(ipv4 get), C(ipv6 get),
    C(ipv6 address list) and C(tag get), and changes only what differs.
  - An interface is not moved; one that exists on another port group, distributed port or
    netstack than the task names fails the task, which says so.
options:
  name:
    description: The interface, C(tknN).
    type: str
    required: true
  state:
    description: Whether the interface exists.
    type: str
    choices: [present, absent]
    default: present
  portgroup:
    description: The port group the interface is connected to (to create it).
    type: str
  dvs_name:
    description: The distributed switch of the interface's distributed port (with I(dvport_id)).
    type: str
  dvport_id:
    description: The distributed port the interface is connected to (with I(dvs_name)).
    type: str
  netstack:
    description: The netstack the interface is created in; hadrocli's default when not given.
    type: str
  mac_address:
    description:
      - The MAC address given to the interface when it is created; on an existing one, a
        different value only warns.
    type: str
  num_rxqueue:
    description:
      - The number of receive dispatch queues given when the interface is created; on an
        existing one, a different value only warns.
    type: int
  mtu:
    description: The MTU of the interface.
    type: int
  enabled:
    description: Whether the interface is enabled.
    type: bool
  ipv4:
    description:
      - The IPv4 settings. Suboptions not given are left as they are, also when others change
        (for a static address, the address, netmask and gateway it has are sent again).
    type: dict
    suboptions:
      type:
        description: C(static), C(dhcp) or C(none).
        type: str
      address:
        description: The static address.
        type: str
      netmask:
        description: The static netmask.
        type: str
      gateway:
        description: The gateway of a static address; C(0.0.0.0) for none.
        type: str
      peer_dns:
        description: Whether to use the DNS servers DHCP gives (DHCP only).
        type: bool
  ipv6:
    description:
      - The IPv6 settings. Suboptions not given are left as they are; the gateway is sent again
        when others change, unless DHCPv6 or router advertisement is on.
    type: dict
    suboptions:
      enabled:
        description: Whether IPv6 is enabled on the interface.
        type: bool
      dhcpv6:
        description: Whether DHCPv6 is enabled.
        type: bool
      router_adv:
        description: Whether addresses from router advertisements are taken.
        type: bool
      peer_dns:
        description: Whether to use the DNS servers DHCPv6 or router advertisements give.
        type: bool
      gateway:
        description: The IPv6 gateway (with DHCPv6 and router advertisement off); C(::) for none.
        type: str
      addresses:
        description:
          - The static IPv6 addresses, as C(ADDRESS/PREFIX), exactly; static addresses not
            listed are removed. Addresses from DHCPv6 or autoconfiguration are not touched.
        type: list
        elements: str
  tags:
    description:
      - The interface's tags (C(Management), C(Glidex), C(Storage), ...), exactly; tags not
        listed are removed.
    type: list
    elements: str
extends_documentation_fragment:
  - hadro.network.hadrocli
attributes:
  check_mode:
    support: full
  diff_mode:
    support: full
author:
  - Hadro network CLI developers
'''

EXAMPLES = r'''
- name: Storage interface with a static address
  hadro.network.ip_interface:
    name: tkn3
    portgroup: Storage
    mtu: 9000
    ipv4:
      type: static
      address: 10.30.0.11
      netmask: 255.255.255.0
    ipv6:
      enabled: true
      addresses: [2001:db8:30::11/64]
    tags: [Storage]

- name: No tkn5
  hadro.network.ip_interface:
    name: tkn5
    state: absent
'''

RETURN = r'''
commands:
  description: The hadrocli command lines the task sent (or would send, in check mode), in order.
  returned: always
  type: list
  elements: str
  sample: ["network ip interface set --interface-name=tkn3 --mtu=9000"]
'''

from ansible.module_utils.basic import AnsibleModule
from ansible_collections.hadro.network.plugins.module_utils.hadrocli import (
    Hadrocli, apply, argument_spec, canon_address, canon_interface_address, command, find)

READS = [
    command('network ip interface list'),
    command('network ip interface ipv4 get'),
    command('network ip interface ipv6 get'),
    command('network ip interface ipv6 address list'),
]

IPV4_FIELDS = (('address', 'ipv4', 'IPv4 Address'), ('netmask', 'netmask', 'IPv4 Netmask'),
               ('gateway', 'gateway', 'Gateway'))
IPV6_FIELDS = (('enabled', 'enable-ipv6', 'IPv6 Enabled'), ('dhcpv6', 'enable-dhcpv6', 'DHCPv6 Enabled'),
               ('router_adv', 'enable-router-adv', 'Router Adv Enabled'), ('peer_dns', 'peer-dns', 'DHCP DNS'))
NO_IPV4 = '0.0.0.0'
NO_IPV6 = '::'


class Refused(Exception):
    pass


def given(options):
    """The suboptions a task gave (those that are not None)."""
    return dict((key, value) for key, value in (options or {}).items() if value is not None)


class Current(object):
    """What the host has of one interface, from the read commands; None members when it has none."""

    def __init__(self, name, interfaces, ipv4, ipv6, addresses, tags=None):
        self.record = find(interfaces, 'Name', name)
        self.ipv4 = find(ipv4, 'Name', name)
        self.ipv6 = find(ipv6, 'Name', name)
        self.static6 = [canon_interface_address('%s/%s' % (a['Address'], a['Netmask']))
                        for a in addresses if a['Interface'] == name and a['Type'] == 'STATIC']
        self.tags = tags

    def view(self):
        if self.record is None:
            return {}
        r = self.record
        view = {'name': r['Name'], 'portgroup': r['Portgroup'], 'netstack': r['Netstack Instance'],
                'mac_address': r['MAC Address'], 'num_rxqueue': r['RXDispQueue Size'],
                'mtu': r['MTU'], 'enabled': r['Enabled']}
        if r['QBR Name'] != 'N/A':
            view['dvs_name'] = r['QBR Name']
            view['dvport_id'] = r['QBR Port']
        if self.ipv4 is not None:
            v4 = self.ipv4
            view['ipv4'] = {'type': v4['Address Type'].lower(), 'address': v4['IPv4 Address'],
                            'netmask': v4['IPv4 Netmask'], 'gateway': v4['Gateway'], 'peer_dns': v4['DHCP DNS']}
        if self.ipv6 is not None:
            v6 = dict((key, self.ipv6[field]) for key, _, field in IPV6_FIELDS)
            v6['gateway'] = self.ipv6['Gateway']
            v6['addresses'] = sorted(self.static6)
            view['ipv6'] = v6
        if self.tags is not None:
            view['tags'] = sorted(self.tags)
        return view


def check_place(params, record):
    """Refused when the interface exists elsewhere than the task says; warnings for settings
    that only apply when it is created."""
    for key, field in (('portgroup', 'Portgroup'), ('dvs_name', 'QBR Name'), ('dvport_id', 'QBR Port'),
                       ('netstack', 'Netstack Instance')):
        if params[key] is not None and params[key] != record[field]:
            raise Refused('interface %s has %s %s, not %s; an interface is not moved: remove it first'
                          % (record['Name'], key, record[field], params[key]))
    warnings = []
    if params['mac_address'] is not None and params['mac_address'].lower() != record['MAC Address'].lower():
        warnings.append('interface %s has MAC address %s; mac_address applies only when it is created'
                        % (record['Name'], record['MAC Address']))
    if params['num_rxqueue'] is not None and params['num_rxqueue'] != record['RXDispQueue Size']:
        warnings.append('interface %s has %d receive queues; num_rxqueue applies only when it is created'
                        % (record['Name'], record['RXDispQueue Size']))
    return warnings


def ipv4_line(name, wanted, have):
    """The ipv4 set line that brings have (the IPv4Interface record, None for a new
    interface) to the wanted suboptions, or None."""
    if not wanted:
        return None
    have_type = have['Address Type'].lower() if have is not None else None
    kind = wanted.get('type', have_type)
    differs = have is None or kind != have_type or any(
        key in wanted and canon_address(wanted[key]) != canon_address(have[field])
        for key, _, field in IPV4_FIELDS)
    peer_dns = wanted.get('peer_dns')
    if not differs:
        if peer_dns is None or peer_dns == have['DHCP DNS']:
            return None
        return command('network ip interface ipv4 set', ('interface-name', name), ('peer-dns', peer_dns))
    options = [('type', kind)]
    for key, option, field in IPV4_FIELDS:
        value = wanted.get(key)
        # The command resets what a static address is not given again.
        if value is None and kind == 'static' and have_type == 'static' and have[field] != NO_IPV4:
            value = have[field]
        options.append((option, value))
    options.append(('peer-dns', peer_dns))
    return command('network ip interface ipv4 set', ('interface-name', name), *options)


def ipv6_line(name, wanted, have):
    """The ipv6 set line that brings have (the IPv6Interface record, None for a new
    interface) to the wanted suboptions (addresses aside), or None."""
    options = []
    for key, option, field in IPV6_FIELDS:
        if key in wanted and (have is None or wanted[key] != have[field]):
            options.append((option, wanted[key]))
    gateway = wanted.get('gateway')
    if gateway is not None and (have is None or canon_address(gateway) != canon_address(have['Gateway'])):
        options.append(('gateway', gateway))
    elif options and have is not None and have['Gateway'] != NO_IPV6:
        # The command resets a gateway it is not given; it takes none with DHCPv6 or RA on.
        settings = dict((key, wanted.get(key, have[field])) for key, _, field in IPV6_FIELDS)
        if not (settings['dhcpv6'] or settings['router_adv']):
            options.append(('gateway', have['Gateway']))
    if not options:
        return None
    return command('network ip interface ipv6 set', ('interface-name', name), *options)


def plan(params, current):
    """(lines, before, after, warnings) for the task's params over the Current interface;
    Refused when it exists elsewhere."""
    name = params['name']
    record = current.record
    before = current.view()
    lines = []
    if params['state'] == 'absent':
        if record is not None:
            lines.append(command('network ip interface remove', ('interface-name', name)))
        return lines, before, {}, []

    after = dict(before)
    if record is None:
        warnings = []
        lines.append(command('network ip interface add', ('interface-name', name),
                             ('portgroup-name', params['portgroup']), ('dvs-name', params['dvs_name']),
                             ('dvport-id', params['dvport_id']), ('netstack', params['netstack']),
                             ('mtu', params['mtu']), ('mac-address', params['mac_address']),
                             ('num-rxqueue', params['num_rxqueue'])))
        after['name'] = name
        for key in ('portgroup', 'dvs_name', 'dvport_id', 'netstack', 'mtu', 'mac_address', 'num_rxqueue'):
            if params[key] is not None:
                after[key] = params[key]
        if params['enabled'] is not None:
            lines.append(command('network ip interface set', ('interface-name', name),
                                 ('enabled', params['enabled'])))
            after['enabled'] = params['enabled']
    else:
        warnings = check_place(params, record)
        settings = []
        if params['enabled'] is not None and params['enabled'] != record['Enabled']:
            settings.append(('enabled', params['enabled']))
            after['enabled'] = params['enabled']
        if params['mtu'] is not None and params['mtu'] != record['MTU']:
            settings.append(('mtu', params['mtu']))
            after['mtu'] = params['mtu']
        if settings:
            lines.append(command('network ip interface set', ('interface-name', name), *settings))

    ipv4 = given(params['ipv4'])
    line = ipv4_line(name, ipv4, current.ipv4 if record is not None else None)
    if line:
        lines.append(line)
        after['ipv4'] = dict(after.get('ipv4', {}), **ipv4)

    ipv6 = given(params['ipv6'])
    have6 = current.ipv6 if record is not None else None
    line = ipv6_line(name, ipv6, have6)
    if line:
        lines.append(line)
        after['ipv6'] = dict(after.get('ipv6', {}), **dict((k, v) for k, v in ipv6.items() if k != 'addresses'))
    if 'addresses' in ipv6:
        have = current.static6 if record is not None else []
        wanted = [canon_interface_address(address) for address in ipv6['addresses']]
        for address in have:
            if address not in wanted:
                lines.append(command('network ip interface ipv6 address remove', ('interface-name', name),
                                     ('ipv6', address)))
        for address, text in zip(wanted, ipv6['addresses']):
            if address not in have:
                lines.append(command('network ip interface ipv6 address add', ('interface-name', name),
                                     ('ipv6', text)))
        after['ipv6'] = dict(after.get('ipv6', {}), addresses=sorted(set(wanted)))

    if params['tags'] is not None:
        have = current.tags if record is not None else []
        for tag in have:
            if tag not in params['tags']:
                lines.append(command('network ip interface tag remove', ('interface-name', name), ('tagname', tag)))
        for tag in params['tags']:
            if tag not in have:
                lines.append(command('network ip interface tag add', ('interface-name', name), ('tagname', tag)))
        after['tags'] = sorted(set(params['tags']))
    return lines, before, after, warnings


ARGUMENT_SPEC = argument_spec(
    name=dict(type='str', required=True),
    state=dict(type='str', choices=['present', 'absent'], default='present'),
    portgroup=dict(type='str'),
    dvs_name=dict(type='str'),
    dvport_id=dict(type='str'),
    netstack=dict(type='str'),
    mac_address=dict(type='str'),
    num_rxqueue=dict(type='int'),
    mtu=dict(type='int'),
    enabled=dict(type='bool'),
    ipv4=dict(type='dict', options=dict(
        type=dict(type='str'),
        address=dict(type='str'),
        netmask=dict(type='str'),
        gateway=dict(type='str'),
        peer_dns=dict(type='bool'),
    )),
    ipv6=dict(type='dict', options=dict(
        enabled=dict(type='bool'),
        dhcpv6=dict(type='bool'),
        router_adv=dict(type='bool'),
        peer_dns=dict(type='bool'),
        gateway=dict(type='str'),
        addresses=dict(type='list', elements='str'),
    )),
    tags=dict(type='list', elements='str'),
)


def main():
    module = AnsibleModule(argument_spec=ARGUMENT_SPEC, supports_check_mode=True)
    cli = Hadrocli(module)
    name = module.params['name']
    interfaces, ipv4, ipv6, addresses = cli.read(READS)
    tags = None
    if find(interfaces, 'Name', name) is not None and module.params['tags'] is not None:
        tags = cli.read_one(command('network ip interface tag get', ('interface-name', name)))['Tags']
    try:
        lines, before, after, warnings = plan(module.params, Current(name, interfaces, ipv4, ipv6, addresses, tags))
    except Refused as e:
        module.fail_json(msg=str(e))
    for warning in warnings:
        module.warn(warning)
    apply(module, cli, lines, before, after)


if __name__ == '__main__':
    main()

#!/usr/bin/python
# -*- coding: utf-8 -*-

from __future__ import absolute_import, division, print_function
__metaclass__ = type

DOCUMENTATION = r'''
module: route
short_description: IPv4 and IPv6 routes of a Hadro host
description:
  - Adds, replaces and removes a static route with hadrocli
    (C(network ip route ipv4 add/remove), C(network ip route ipv6 add/remove)).
  - Reads the routes with C(network ip route ipv4 list) or C(ipv6 list) and changes only what
    differs. A netstack has one route per network; a route to the network through another
    gateway is replaced, in one transaction.
  - The family is IPv6 when I(network) or I(gateway) holds a colon, else IPv4.
options:
  network:
    description: The destination, C(ADDRESS/PREFIX), or C(default).
    type: str
    required: true
  gateway:
    description:
      - The gateway the route goes through; needed to add a route.
      - When not given, a route to I(network) through any gateway is the route meant; with
        I(state=present) it is kept as it is, with I(state=absent) it is removed. When given,
        I(state=absent) removes the route only when it goes through this gateway.
    type: str
  netstack:
    description: The netstack of the route; hadrocli's default netstack when not given.
    type: str
  state:
    description: Whether the route exists.
    type: str
    choices: [present, absent]
    default: present
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
- name: Backup network through the storage router
  hadro.network.route:
    network: 10.40.0.0/16
    gateway: 192.0.2.254

- name: IPv6 default route
  hadro.network.route:
    network: default
    gateway: 2001:db8:10::1

- name: No route to 198.18.0.0/15
  hadro.network.route:
    network: 198.18.0.0/15
    state: absent
'''

RETURN = r'''
commands:
  description: The hadrocli command lines the task sent (or would send, in check mode), in order.
  returned: always
  type: list
  elements: str
  sample: ["network ip route ipv4 add --network=10.40.0.0/16 --gateway=192.0.2.254"]
'''

from ansible.module_utils.basic import AnsibleModule
from ansible_collections.hadro.network.plugins.module_utils.hadrocli import (
    Hadrocli, apply, argument_spec, canon_address, canon_network, command, prefix_length)


def family(params):
    return 'ipv6' if ':' in params['network'] + (params['gateway'] or '') else 'ipv4'


def destination(network, ipv6):
    """The canonical ADDRESS/PREFIX of a route's destination ('default' is the network of length 0)."""
    if network == 'default':
        return '::/0' if ipv6 else '0.0.0.0/0'
    return canon_network(network)


def record_destination(record, ipv6):
    if record['Network'] == 'default':
        return destination('default', ipv6)
    return canon_network('%s/%s' % (record['Network'], prefix_length(record['Netmask'])))


def view(record, ipv6):
    if record is None:
        return {}
    return {'network': record_destination(record, ipv6), 'gateway': record['Gateway'],
            'interface': record['Interface']}


def plan(params, routes):
    """(lines, before, after) for the task's params over the listed routes of its family."""
    kind = family(params)
    ipv6 = kind == 'ipv6'
    wanted = destination(params['network'], ipv6)
    current = None
    for record in routes:
        if record_destination(record, ipv6) == wanted:
            current = record
            break
    before = view(current, ipv6)
    netstack = ('netstack', params['netstack'])
    gateway = params['gateway']
    # A gateway not given is any gateway.
    matches = current is not None and (gateway is None or canon_address(gateway) == canon_address(current['Gateway']))
    lines = []
    remove = None
    if current is not None:
        remove = command('network ip route %s remove' % kind,
                         ('network', 'default' if current['Network'] == 'default' else before['network']),
                         ('gateway', current['Gateway']), netstack)
    if params['state'] == 'absent':
        if matches:
            return [remove], before, {}
        return lines, before, before
    if matches:
        return lines, before, before
    if remove is not None:
        lines.append(remove)
    lines.append(command('network ip route %s add' % kind, ('network', params['network']),
                         ('gateway', gateway), netstack))
    return lines, before, {'network': wanted, 'gateway': gateway}


ARGUMENT_SPEC = argument_spec(
    network=dict(type='str', required=True),
    gateway=dict(type='str'),
    netstack=dict(type='str'),
    state=dict(type='str', choices=['present', 'absent'], default='present'),
)


def main():
    module = AnsibleModule(argument_spec=ARGUMENT_SPEC, supports_check_mode=True)
    cli = Hadrocli(module)
    routes = cli.read_one(command('network ip route %s list' % family(module.params),
                                  ('netstack', module.params['netstack'])))
    lines, before, after = plan(module.params, routes)
    apply(module, cli, lines, before, after)


if __name__ == '__main__':
    main()

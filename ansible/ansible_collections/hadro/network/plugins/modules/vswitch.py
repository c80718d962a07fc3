#!/usr/bin/python
# -*- coding: utf-8 -*-

from __future__ import absolute_import, division, print_function
__metaclass__ = type

DOCUMENTATION = r'''
module: vswitch
short_description: Standard virtual switches of a Hadro host
description:
  - Adds, changes and removes a standard virtual switch with hadrocli
    (C(network vswitch standard add/set/remove/uplink add/uplink remove)).
  - Reads the switches with C(network vswitch standard list) and changes only what differs.
options:
  name:
    description: The name of the switch.
    type: str
    required: true
  state:
    description: Whether the switch exists.
    type: str
    choices: [present, absent]
    default: present
  mtu:
    description: The MTU of the switch.
    type: int
  cdp_status:
    description: The CDP status (C(down), C(listen), C(advertise) or C(both)).
    type: str
  ports:
    description:
      - The number of ports given to the switch when it is created.
      - A switch that exists keeps its number of ports; a different value only warns.
    type: int
  uplinks:
    description:
      - The NICs that are the switch's uplinks, exactly; those not listed are removed.
      - When not given, the uplinks are left as they are.
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
- name: Storage switch with two uplinks and jumbo frames
  hadro.network.vswitch:
    name: vSwitch2
    mtu: 9000
    uplinks: [vmnic3, vmnic4]

- name: No switch vSwitch9
  hadro.network.vswitch:
    name: vSwitch9
    state: absent
'''

RETURN = r'''
commands:
  description: The hadrocli command lines the task sent (or would send, in check mode), in order.
  returned: always
  type: list
  elements: str
  sample: ["network vswitch standard set --vswitch-name=vSwitch2 --mtu=9000"]
'''

from ansible.module_utils.basic import AnsibleModule
from ansible_collections.hadro.network.plugins.module_utils.hadrocli import (
    Hadrocli, apply, argument_spec, command, find)

LIST = 'network vswitch standard list'


def view(record):
    if record is None:
        return {}
    return {
        'name': record['Name'],
        'mtu': record['MTU'],
        'cdp_status': record['CDP Status'],
        'ports': record['Num Ports'],
        'uplinks': sorted(record['Uplinks']),
    }


def plan(params, switches):
    """(lines, before, after, warnings) for the task's params over the listed switches."""
    name = params['name']
    current = find(switches, 'Name', name)
    before = view(current)
    lines = []
    warnings = []
    if params['state'] == 'absent':
        if current is not None:
            lines.append(command('network vswitch standard remove', ('vswitch-name', name)))
        return lines, before, {}, warnings

    after = dict(before) if current is not None else {'name': name}
    if current is None:
        lines.append(command('network vswitch standard add', ('vswitch-name', name),
                             ('ports', params['ports'])))
        if params['ports'] is not None:
            after['ports'] = params['ports']
    elif params['ports'] is not None and params['ports'] != current['Num Ports']:
        warnings.append('vswitch %s has %d ports; ports applies only when a switch is created'
                        % (name, current['Num Ports']))

    settings = []
    for option, key, field in (('mtu', 'mtu', 'MTU'), ('cdp-status', 'cdp_status', 'CDP Status')):
        wanted = params[key]
        if wanted is not None and (current is None or wanted != current[field]):
            settings.append((option, wanted))
            after[key] = wanted
    if settings:
        lines.append(command('network vswitch standard set', ('vswitch-name', name), *settings))

    if params['uplinks'] is not None:
        have = current['Uplinks'] if current is not None else []
        for uplink in have:
            if uplink not in params['uplinks']:
                lines.append(command('network vswitch standard uplink remove', ('vswitch-name', name),
                                     ('uplink-name', uplink)))
        for uplink in params['uplinks']:
            if uplink not in have:
                lines.append(command('network vswitch standard uplink add', ('vswitch-name', name),
                                     ('uplink-name', uplink)))
        after['uplinks'] = sorted(set(params['uplinks']))
    return lines, before, after, warnings


ARGUMENT_SPEC = argument_spec(
    name=dict(type='str', required=True),
    state=dict(type='str', choices=['present', 'absent'], default='present'),
    mtu=dict(type='int'),
    cdp_status=dict(type='str'),
    ports=dict(type='int'),
    uplinks=dict(type='list', elements='str'),
)


def main():
    module = AnsibleModule(argument_spec=ARGUMENT_SPEC, supports_check_mode=True)
    cli = Hadrocli(module)
    lines, before, after, warnings = plan(module.params, cli.read_one(command(LIST)))
    for warning in warnings:
        module.warn(warning)
    apply(module, cli, lines, before, after)


if __name__ == '__main__':
    main()

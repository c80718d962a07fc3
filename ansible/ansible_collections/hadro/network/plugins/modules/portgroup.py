#!/usr/bin/python
# -*- coding: utf-8 -*-

from __future__ import absolute_import, division, print_function
__metaclass__ = type

DOCUMENTATION = r'''
module: portgroup
short_description: Port groups of standard switches on a Hadro host
description:
  - Adds, changes and removes a port group of a standard switch with hadrocli
    (C(network vswitch standard portgroup add/set/remove)).
  - Reads the port groups with C(network vswitch standard portgroup list) and changes only
    what differs.
  - Port group names are unique on a host. A port group that exists on another switch than
    I(vswitch) is not moved (that would drop its policies and its clients); the task fails and
    says so.
options:
  name:
    description: The name of the port group.
    type: str
    required: true
  vswitch:
    description:
      - The standard switch the port group belongs to. Needed to create it.
      - With I(state=absent), the port group is removed only from this switch; when not
        given, from whichever switch holds it.
    type: str
  vlan_id:
    description: The VLAN ID of the port group (0 to 4095; 4095 passes every VLAN).
    type: int
  state:
    description: Whether the port group exists.
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
- name: Storage traffic on VLAN 30
  hadro.network.portgroup:
    name: Storage
    vswitch: vSwitch1
    vlan_id: 30

- name: No Lab port group
  hadro.network.portgroup:
    name: Lab
    state: absent
'''

RETURN = r'''
commands:
  description: The hadrocli command lines the task sent (or would send, in check mode), in order.
  returned: always
  type: list
  elements: str
  sample: ["network vswitch standard portgroup set --portgroup-name=Storage --vlan-id=30"]
'''

from ansible.module_utils.basic import AnsibleModule
from ansible_collections.hadro.network.plugins.module_utils.hadrocli import (
    Hadrocli, apply, argument_spec, command, find)

LIST = 'network vswitch standard portgroup list'


class Refused(Exception):
    pass


def view(record):
    if record is None:
        return {}
    return {'name': record['Name'], 'vswitch': record['Virtual Switch'], 'vlan_id': record['VLAN ID']}


def plan(params, portgroups):
    """(lines, before, after) for the task's params over the listed port groups; Refused
    when the port group would have to move to another switch."""
    name = params['name']
    vswitch = params['vswitch']
    current = find(portgroups, 'Name', name)
    before = view(current)
    lines = []
    if params['state'] == 'absent':
        if current is not None and vswitch in (None, current['Virtual Switch']):
            lines.append(command('network vswitch standard portgroup remove', ('portgroup-name', name),
                                 ('vswitch-name', current['Virtual Switch'])))
            return lines, before, {}
        return lines, before, before

    if current is None:
        lines.append(command('network vswitch standard portgroup add', ('portgroup-name', name),
                             ('vswitch-name', vswitch)))
        after = {'name': name, 'vswitch': vswitch}
    elif vswitch is not None and vswitch != current['Virtual Switch']:
        raise Refused('port group %s is on virtual switch %s, not %s; remove it there first'
                      % (name, current['Virtual Switch'], vswitch))
    else:
        after = dict(before)
    vlan = params['vlan_id']
    if vlan is not None and (current is None or vlan != current['VLAN ID']):
        lines.append(command('network vswitch standard portgroup set', ('portgroup-name', name),
                             ('vlan-id', vlan)))
        after['vlan_id'] = vlan
    return lines, before, after


ARGUMENT_SPEC = argument_spec(
    name=dict(type='str', required=True),
    vswitch=dict(type='str'),
    vlan_id=dict(type='int'),
    state=dict(type='str', choices=['present', 'absent'], default='present'),
)


def main():
    module = AnsibleModule(argument_spec=ARGUMENT_SPEC, supports_check_mode=True)
    cli = Hadrocli(module)
    try:
        lines, before, after = plan(module.params, cli.read_one(command(LIST)))
    except Refused as e:
        module.fail_json(msg=str(e))
    apply(module, cli, lines, before, after)


if __name__ == '__main__':
    main()

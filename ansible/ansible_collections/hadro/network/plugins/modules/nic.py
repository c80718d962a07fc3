#!/usr/bin/python
# -*- coding: utf-8 -*-

from __future__ import absolute_import, division, print_function
__metaclass__ = type

DOCUMENTATION = r'''
module: nic
short_description: Physical NIC settings of a Hadro host
description:
  - Brings a physical NIC up or down and sets its link and driver settings with hadrocli
    (C(network nic up/down), C(network nic set)).
  - Reads the NIC with C(network nic list) and C(network nic get) and changes only what differs.
options:
  name:
    description: The NIC, as C(network nic list) names it (C(vmnic0)).
    type: str
    required: true
  enabled:
    description: Whether the NIC is administratively up.
    type: bool
  auto_negotiate:
    description:
      - C(true) lets the NIC negotiate its speed and duplex.
      - C(false) fixes them, at I(speed) and I(duplex) when given, else at those the link has now.
        A fixed I(speed) and I(duplex) turn negotiation off in any case.
    type: bool
  speed:
    description: The fixed speed in Mbps, with I(duplex).
    type: int
  duplex:
    description: The fixed duplex, C(full) or C(half), with I(speed).
    type: str
  wake_on_lan:
    description:
      - The Wake-on-LAN modes, as letters (C(p) PHY activity, C(u) unicast, C(m) multicast,
        C(b) broadcast, C(a) ARP, C(g) magic packet, C(s) SecureOn password); their order does not matter.
    type: str
  message_level:
    description: The driver message level.
    type: int
  port:
    description: The device port (C(tp), C(aui), C(bnc), C(mii), C(fibre), C(da)).
    type: str
  transceiver:
    description: The transceiver type, C(internal) or C(external).
    type: str
  phy_address:
    description: The PHY address.
    type: int
  virtual_address:
    description: The virtual address.
    type: str
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
- name: vmnic1 up, at a fixed 10 Gb/s, waking on magic packets
  hadro.network.nic:
    name: vmnic1
    enabled: true
    speed: 10000
    duplex: full
    wake_on_lan: g
'''

RETURN = r'''
commands:
  description: The hadrocli command lines the task sent (or would send, in check mode), in order.
  returned: always
  type: list
  elements: str
  sample: ["network nic set --nic-name=vmnic1 --speed=10000 --duplex=full"]
'''

from ansible.module_utils.basic import AnsibleModule
from ansible_collections.hadro.network.plugins.module_utils.hadrocli import (
    FLAG, Hadrocli, apply, argument_spec, command, find)

# The letters of --wake-on-lan and how nic get shows each mode.
WAKE_ON = {
    'p': 'PHY Activity',
    'u': 'Unicast Messagess',
    'm': 'Multicast Messages',
    'b': 'Broadcast Messages',
    'a': 'ARP',
    'g': 'MagicPacket(tm)',
    's': 'Enable SecureOn(tm) Password for' + ' ' * 28 + 'MagicPacket(tm)',
}
# --port and how nic get shows it as the cable type.
PORTS = {'tp': 'Twisted Pair', 'aui': 'AUI', 'bnc': 'BNC', 'mii': 'MII', 'fibre': 'FIBRE', 'da': 'DA'}


def wake_on_letters(modes):
    """The letters of the modes nic get shows; None when one has no letter (none, disabled)."""
    letters = ''
    for mode in modes:
        letter = [key for key, text in WAKE_ON.items() if text == mode]
        if not letter:
            return None
        letters += letter[0]
    return ''.join(sorted(letters))


def view(nic, info):
    return {
        'name': nic['Name'], 'enabled': nic['Admin Status'] == 'Up', 'auto_negotiate': info['Auto Negotiation'],
        'speed': nic['Speed'], 'duplex': nic['Duplex'].lower(),
        'wake_on_lan': wake_on_letters(info['Wakeon']), 'message_level': info['Current Message Level'],
        'port': dict((text, key) for key, text in PORTS.items()).get(info['Cable Type'], info['Cable Type']),
        'transceiver': info['Transceiver'], 'phy_address': info['PHY Address'],
        'virtual_address': info['Virtual Address'],
    }


def plan(params, nic, info):
    """(lines, before, after) for the task's params over the Nic record and the NICInfo record."""
    name = params['name']
    before = view(nic, info)
    after = dict(before)
    settings = []

    def differs(key):
        return params[key] is not None and params[key] != before[key]

    for key, option in (('port', 'port'), ('phy_address', 'phy-address'),
                        ('virtual_address', 'virtual-address'), ('transceiver', 'transceiver-type'),
                        ('message_level', 'message-level')):
        if differs(key):
            settings.append((option, params[key]))
            after[key] = params[key]
    wol = params['wake_on_lan']
    if wol is not None and ''.join(sorted(set(wol))) != before['wake_on_lan']:
        settings.append(('wake-on-lan', wol))
        after['wake_on_lan'] = ''.join(sorted(set(wol)))
    speed, duplex = params['speed'], params['duplex']
    if speed is not None or duplex is not None:
        fixed = not before['auto_negotiate'] and speed in (None, before['speed']) and \
            (duplex is None or duplex.lower() == before['duplex'])
        if not fixed:
            settings += [('speed', speed), ('duplex', duplex)]
            after.update(auto_negotiate=False, speed=speed, duplex=duplex)
    if params['auto_negotiate'] and not before['auto_negotiate']:
        settings.append(('auto', FLAG))
        after['auto_negotiate'] = True
    elif params['auto_negotiate'] is False and before['auto_negotiate'] and speed is None and duplex is None:
        # Negotiation ends by fixing a speed and duplex: those the link has now.
        settings += [('speed', before['speed']), ('duplex', before['duplex'])]
        after['auto_negotiate'] = False
    lines = []
    if settings:
        lines.append(command('network nic set', ('nic-name', name), *settings))
    if differs('enabled'):
        lines.append(command('network nic %s' % ('up' if params['enabled'] else 'down'), ('nic-name', name)))
        after['enabled'] = params['enabled']
    return lines, before, after


ARGUMENT_SPEC = argument_spec(
    name=dict(type='str', required=True),
    enabled=dict(type='bool'),
    auto_negotiate=dict(type='bool'),
    speed=dict(type='int'),
    duplex=dict(type='str'),
    wake_on_lan=dict(type='str'),
    message_level=dict(type='int'),
    port=dict(type='str'),
    transceiver=dict(type='str'),
    phy_address=dict(type='int'),
    virtual_address=dict(type='str'),
)


def main():
    module = AnsibleModule(argument_spec=ARGUMENT_SPEC, supports_check_mode=True)
    cli = Hadrocli(module)
    name = module.params['name']
    nics, info = cli.read([command('network nic list'), command('network nic get', ('nic-name', name))])
    lines, before, after = plan(module.params, find(nics, 'Name', name), info)
    apply(module, cli, lines, before, after)


if __name__ == '__main__':
    main()

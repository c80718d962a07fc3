#!/usr/bin/python
# -*- coding: utf-8 -*-

from __future__ import absolute_import, division, print_function
__metaclass__ = type

DOCUMENTATION = r'''
module: firewall_ruleset
short_description: Firewall rulesets of a Hadro host
description:
  - Enables and disables a firewall ruleset and sets the addresses it allows with hadrocli
    (C(network firewall ruleset set), C(network firewall ruleset allowedip add/remove)).
  - Reads the ruleset with C(network firewall ruleset list) and C(allowedip list) and changes
    only what differs.
  - While a ruleset allows all addresses the host shows C(All) instead of its list and refuses
    changes to it. The module reads and changes the list all the same, inside one transaction
    that turns the flag off and back on; the host ends as the task says.
options:
  name:
    description: The ruleset.
    type: str
    required: true
  enabled:
    description: Whether the ruleset is enabled.
    type: bool
  allowed_all:
    description: Whether the ruleset allows all addresses rather than its list.
    type: bool
  allowed_ips:
    description:
      - The addresses and networks (C(ADDRESS/PREFIX)) the ruleset allows when it does not allow
        all, exactly; those not listed are removed.
      - When not given, the list is left as it is.
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
- name: SSH from the management networks only
  hadro.network.firewall_ruleset:
    name: sshServer
    enabled: true
    allowed_all: false
    allowed_ips: [192.0.2.0/24, 2001:db8:10::/64]
'''

RETURN = r'''
commands:
  description: The hadrocli command lines the task sent (or would send, in check mode), in order.
  returned: always
  type: list
  elements: str
  sample: ["network firewall ruleset allowedip add --ruleset-id=sshServer --ip-address=192.0.2.0/24"]
'''

from ansible.module_utils.basic import AnsibleModule
from ansible_collections.hadro.network.plugins.module_utils.hadrocli import (
    Hadrocli, apply, argument_spec, canon_address, canon_network, command)

ALL = ['All']


def canon_allowed(text):
    """An allowed address or network in the form the host keeps; an address and the network
    of that one address are different entries."""
    return canon_network(text) if '/' in text else canon_address(text)


def plan(params, ruleset, allowed, stored):
    """(lines, before, after) for the task's params over the Ruleset record, its allowedip
    list and, where it allows all, the list it keeps (None when not read)."""
    name = params['name']
    rid = ('ruleset-id', name)
    have_all = allowed == ALL
    have_ips = stored if have_all else allowed
    before = {'name': name, 'enabled': ruleset['Enabled'], 'allowed_all': have_all}
    if have_ips is not None:
        before['allowed_ips'] = sorted(have_ips)
    after = dict(before)

    edits = []
    if params['allowed_ips'] is not None:
        wanted = [canon_allowed(ip) for ip in params['allowed_ips']]
        have = [canon_allowed(ip) for ip in have_ips]
        edits += [command('network firewall ruleset allowedip remove', rid, ('ip-address', ip))
                  for ip, canon in zip(have_ips, have) if canon not in wanted]
        edits += [command('network firewall ruleset allowedip add', rid, ('ip-address', ip))
                  for ip, canon in zip(params['allowed_ips'], wanted) if canon not in have]
        after['allowed_ips'] = sorted(set(wanted)) if edits else before['allowed_ips']
    lines = []
    flag = have_all
    if edits and have_all:
        lines.append(command('network firewall ruleset set', rid, ('allowed-all', False)))
        flag = False
    lines += edits
    settings = []
    if params['enabled'] is not None and params['enabled'] != ruleset['Enabled']:
        settings.append(('enabled', params['enabled']))
        after['enabled'] = params['enabled']
    want_all = have_all if params['allowed_all'] is None else params['allowed_all']
    if want_all != flag:
        settings.append(('allowed-all', want_all))
    after['allowed_all'] = want_all
    if settings:
        lines.append(command('network firewall ruleset set', rid, *settings))
    return lines, before, after


ARGUMENT_SPEC = argument_spec(
    name=dict(type='str', required=True),
    enabled=dict(type='bool'),
    allowed_all=dict(type='bool'),
    allowed_ips=dict(type='list', elements='str'),
)


def main():
    module = AnsibleModule(argument_spec=ARGUMENT_SPEC, supports_check_mode=True)
    cli = Hadrocli(module)
    rid = ('ruleset-id', module.params['name'])
    rulesets, allowed = cli.read([command('network firewall ruleset list', rid),
                                  command('network firewall ruleset allowedip list', rid)])
    allowed = allowed[0]['Allowed IP Addresses']
    stored = None
    if allowed == ALL and module.params['allowed_ips'] is not None:
        # The list hidden behind "All": shown with the flag off, which is turned on again in
        # the same transaction, so the host is left as it was.
        stored = cli.read([command('network firewall ruleset set', rid, ('allowed-all', False)),
                           command('network firewall ruleset allowedip list', rid),
                           command('network firewall ruleset set', rid, ('allowed-all', True))])[1]
        stored = stored[0]['Allowed IP Addresses']
    lines, before, after = plan(module.params, rulesets[0], allowed, stored)
    apply(module, cli, lines, before, after)


if __name__ == '__main__':
    main()

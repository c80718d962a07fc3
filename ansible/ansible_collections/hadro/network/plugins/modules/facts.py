#!/usr/bin/python
# -*- coding: utf-8 -*-

from __future__ import absolute_import, division, print_function
__metaclass__ = type

DOCUMENTATION = r'''
module: facts
short_description: The network of a Hadro host as facts
description:
  - Gathers the host's network with hadrocli's list commands, all read in one session, and
    returns it as C(ansible_facts.hadro_network).
  - Records keep the field names of the commands' C(--formatter=json) output.
options:
  netstack:
    description: The netstack whose routes and DNS settings are read; hadrocli's default netstack when not given.
    type: str
extends_documentation_fragment:
  - hadro.network.hadrocli
attributes:
  check_mode:
    support: full
  diff_mode:
    support: none
author:
  - Hadro network CLI developers
'''

EXAMPLES = r'''
- name: Gather the host's network
  hadro.network.facts:

- name: Uplinks of vSwitch0
  ansible.builtin.debug:
    msg: "{{ (hadro_network.vswitches | selectattr('Name', 'eq', 'vSwitch0') | first).Uplinks }}"
'''

RETURN = r'''
ansible_facts:
  description: The host's network.
  returned: always
  type: dict
  contains:
    hadro_network:
      description: The records of the list commands.
      type: dict
      contains:
        interfaces:
          description: C(network ip interface list), every netstack.
          type: list
          elements: dict
          sample: [{"Name": "tkn0", "Portgroup": "Management Network", "MTU": 1500, "Enabled": true}]
        vswitches:
          description: C(network vswitch standard list).
          type: list
          elements: dict
        portgroups:
          description: C(network vswitch standard portgroup list).
          type: list
          elements: dict
        nics:
          description: C(network nic list).
          type: list
          elements: dict
        routes:
          description: C(network ip route ipv4 list) and C(ipv6 list), under C(ipv4) and C(ipv6).
          type: dict
          sample: {"ipv4": [{"Network": "default", "Netmask": "0.0.0.0", "Gateway": "192.0.2.1"}], "ipv6": []}
        dns:
          description: The records of C(network ip dns server list) and C(search list) in one.
          type: dict
          sample: {"DNS Servers": ["192.0.2.53"], "DNS Search Domains": ["example.com"]}
        firewall:
          description:
            - The record of C(network firewall get) with C(Rulesets), the records of
              C(network firewall ruleset list), each with its C(Allowed IP Addresses) from
              C(allowedip list).
          type: dict
          sample: {"Loaded": true, "Enabled": true, "DefaultAction": "DROP",
                   "Rulesets": [{"Name": "sshServer", "Enabled": true, "Allowed IP Addresses": ["All"]}]}
'''

from ansible.module_utils.basic import AnsibleModule
from ansible_collections.hadro.network.plugins.module_utils.hadrocli import (
    Hadrocli, argument_spec, command)


def reads(netstack):
    stack = ('netstack', netstack)
    return [
        command('network ip interface list'),
        command('network vswitch standard list'),
        command('network vswitch standard portgroup list'),
        command('network nic list'),
        command('network ip route ipv4 list', stack),
        command('network ip route ipv6 list', stack),
        command('network ip dns server list', stack),
        command('network ip dns search list', stack),
        command('network firewall get'),
        command('network firewall ruleset list'),
        command('network firewall ruleset allowedip list'),
    ]


def gather(results):
    """hadro_network from the results of reads(), in their order."""
    interfaces, vswitches, portgroups, nics, ipv4, ipv6, servers, search, firewall, rulesets, allowed = results
    allowed = dict((record['Ruleset'], record['Allowed IP Addresses']) for record in allowed)
    firewall = dict(firewall)
    firewall['Rulesets'] = [dict(ruleset, **{'Allowed IP Addresses': allowed.get(ruleset['Name'], [])})
                            for ruleset in rulesets]
    dns = dict(servers)
    dns.update(search)
    return {
        'interfaces': interfaces,
        'vswitches': vswitches,
        'portgroups': portgroups,
        'nics': nics,
        'routes': {'ipv4': ipv4, 'ipv6': ipv6},
        'dns': dns,
        'firewall': firewall,
    }


ARGUMENT_SPEC = argument_spec(netstack=dict(type='str'))


def main():
    module = AnsibleModule(argument_spec=ARGUMENT_SPEC, supports_check_mode=True)
    cli = Hadrocli(module)
    facts = gather(cli.read(reads(module.params['netstack'])))
    module.exit_json(changed=False, ansible_facts={'hadro_network': facts})


if __name__ == '__main__':
    main()

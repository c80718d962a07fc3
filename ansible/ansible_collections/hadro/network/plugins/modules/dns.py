#!/usr/bin/python
# -*- coding: utf-8 -*-

from __future__ import absolute_import, division, print_function
__metaclass__ = type

DOCUMENTATION = r'''
module: dns
short_description: DNS servers and search domains of a Hadro host
description:
  - Sets the ordered lists of DNS servers and search domains of a netstack with hadrocli
    (C(network ip dns server add/remove), C(network ip dns search add/remove)).
  - Reads them with C(network ip dns server list) and C(search list) and changes as little as it
    can; entries not wanted are removed, the longest run of wanted ones already in order is
    kept, and the rest are added after it in order.
  - Addresses compare in their canonical form, domains without regard to case.
options:
  servers:
    description:
      - The DNS servers, in the order they are asked, exactly. An empty list removes them all.
      - When not given, the servers are left as they are.
    type: list
    elements: str
  search_domains:
    description:
      - The search domains, in the order they are tried, exactly. An empty list removes them all.
      - When not given, the search domains are left as they are.
    type: list
    elements: str
  netstack:
    description: The netstack; hadrocli's default netstack when not given.
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
- name: Resolvers of the lab
  hadro.network.dns:
    servers: [192.0.2.53, 2001:db8:10::53]
    search_domains: [lab.example.com, example.com]
'''

RETURN = r'''
commands:
  description: The hadrocli command lines the task sent (or would send, in check mode), in order.
  returned: always
  type: list
  elements: str
  sample: ["network ip dns server add --server=192.0.2.54"]
'''

from ansible.module_utils.basic import AnsibleModule
from ansible_collections.hadro.network.plugins.module_utils.hadrocli import (
    FLAG, Hadrocli, apply, argument_spec, canon_address, command, ordered_list_plan)


def same_server(a, b):
    return canon_address(a) == canon_address(b)


def same_domain(a, b):
    return a.lower() == b.lower()


def plan(params, servers, domains):
    """(lines, before, after) for the task's params over the current lists."""
    netstack = ('netstack', params['netstack'])
    before = {'servers': servers, 'search_domains': domains}
    after = dict(before)
    lines = []
    if params['servers'] is not None:
        remove, add = ordered_list_plan(servers, params['servers'], same_server)
        if len(remove) == len(servers) and len(remove) > 1:
            lines.append(command('network ip dns server remove', ('all', FLAG), netstack))
        else:
            lines += [command('network ip dns server remove', ('server', s), netstack) for s in remove]
        lines += [command('network ip dns server add', ('server', s), netstack) for s in add]
        if remove or add:
            after['servers'] = list(params['servers'])
    if params['search_domains'] is not None:
        remove, add = ordered_list_plan(domains, params['search_domains'], same_domain)
        lines += [command('network ip dns search remove', ('domain', d), netstack) for d in remove]
        lines += [command('network ip dns search add', ('domain', d), netstack) for d in add]
        if remove or add:
            after['search_domains'] = list(params['search_domains'])
    return lines, before, after


ARGUMENT_SPEC = argument_spec(
    servers=dict(type='list', elements='str'),
    search_domains=dict(type='list', elements='str'),
    netstack=dict(type='str'),
)


def main():
    module = AnsibleModule(argument_spec=ARGUMENT_SPEC, supports_check_mode=True)
    cli = Hadrocli(module)
    netstack = ('netstack', module.params['netstack'])
    servers, domains = cli.read([command('network ip dns server list', netstack),
                                 command('network ip dns search list', netstack)])
    lines, before, after = plan(module.params, servers['DNS Servers'], domains['DNS Search Domains'])
    apply(module, cli, lines, before, after)


if __name__ == '__main__':
    main()

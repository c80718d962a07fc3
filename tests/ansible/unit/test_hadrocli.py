# Modules run in this process against hadrocli: what reaches its command line, how its
# failures end the task, and that check mode and failures leave the host as it was.

import os
import unittest

from support import Scratch, ScratchHost, needs_programs, run_module
from ansible_collections.hadro.network.plugins.modules import (
    dns, facts, firewall_ruleset, ip_interface, nic, portgroup, route, vswitch)


@needs_programs
class ChangesTest(ScratchHost):
    def test_names_reach_the_host_as_they_are(self):
        # Blanks, quotes, backslashes, '#', '$' and a leading '-' survive the batch line.
        name = '''-it's #1 "a\\b" $HOME ~'''
        args = self.args(name=name, vswitch='vSwitch1', vlan_id=7)
        self.assertTrue(run_module(portgroup, args).result['changed'])
        self.assertIn({'Name': name, 'Virtual Switch': 'vSwitch1', 'Active Clients': 0, 'VLAN ID': 7},
                      self.hadrocli('network', 'vswitch', 'standard', 'portgroup', 'list'))
        self.assertFalse(run_module(portgroup, args).result['changed'])

    def test_a_second_run_finds_what_the_first_one_set(self):
        # The host's own forms (netmasks, compressed addresses, cases, orders) read back equal.
        cases = [
            (vswitch, dict(name='vSwitch1', cdp_status='both', uplinks=['vmnic4', 'vmnic2'])),
            (portgroup, dict(name='VM Network', vlan_id=12)),
            (ip_interface, dict(name='tkn1', enabled=False, ipv4={'address': '198.51.100.22'},
                                ipv6={'enabled': True, 'addresses': ['2001:DB8:20::5/64']})),
            (route, dict(network='0.0.0.0/0', gateway='192.0.2.254')),
            (route, dict(network='2001:DB8:99::/48', gateway='2001:db8:10::1')),
            (ip_interface, dict(name='tkn0', ipv6={'enabled': False}, tags=['Storage', 'Management'])),
            (dns, dict(servers=['2001:DB8:10::53', '192.0.2.53'], search_domains=['Example.com', 'lab.example.com'])),
            (firewall_ruleset, dict(name='webAccess', allowed_all=True,
                                    allowed_ips=['192.0.2.200', '198.51.100.0/24'])),
            (firewall_ruleset, dict(name='webAccess', allowed_ips=['192.0.2.201'])),
            (nic, dict(name='vmnic1', enabled=False, auto_negotiate=False, wake_on_lan='ug')),
        ]
        for module, args in cases:
            first = run_module(module, self.args(**args))
            self.assertEqual((first.failed, first.result.get('changed')), (False, True), (args, first.result))
            second = run_module(module, self.args(**args))
            self.assertEqual((second.failed, second.result.get('changed')), (False, False), (args, second.result))
        # What the commands would have reset is as it was.
        self.assertEqual(self.hadrocli('network', 'ip', 'interface', 'ipv4', 'get', '-i', 'tkn1')[0]['Gateway'],
                         '198.51.100.1')
        self.assertEqual(self.hadrocli('network', 'ip', 'interface', 'ipv6', 'get', '-n', 'tkn0')[0]['Gateway'],
                         '2001:db8:10::1')

    def test_check_mode_plans_and_changes_nothing(self):
        before = self.export()
        end = run_module(vswitch, self.args(name='vs9', mtu=9000), check_mode=True, diff=True)
        self.assertEqual(end.result['commands'], ['network vswitch standard add --vswitch-name=vs9',
                                                  'network vswitch standard set --vswitch-name=vs9 --mtu=9000'])
        self.assertEqual(end.result['diff'], {'before': {}, 'after': {'name': 'vs9', 'mtu': 9000}})
        self.assertEqual(self.export(), before)

    def test_a_refused_command_fails_the_task_and_nothing_is_applied(self):
        before = self.export()
        end = run_module(vswitch, self.args(name='vs9', mtu=19000, uplinks=['vmnic4']))
        self.assertTrue(end.failed)
        self.assertEqual((end.result['rc'], end.result['msg'], end.result['failed_command']), (
            1, 'Unable to set the MTU of virtual switch vs9: the MTU must be between 1280 and 9000',
            'network vswitch standard set --vswitch-name=vs9 --mtu=19000'))
        self.assertEqual(self.export(), before)
        # A line the command line parser refuses (status 2) ends the same way.
        end = run_module(portgroup, self.args(name='Lab', vswitch='vSwitch1', vlan_id=5000))
        self.assertEqual((end.failed, end.result['rc']), (True, 2))
        self.assertRegex(end.result['msg'], '^Error: option --vlan-id: 5000 is not within the range 0 to 4095')
        self.assertEqual(self.export(), before)

    def test_a_line_break_cannot_reach_a_batch_line(self):
        before = self.export()
        end = run_module(portgroup, self.args(name='Lab\nnetwork vswitch standard remove -v vSwitch0',
                                              vswitch='vSwitch1'))
        self.assertTrue(end.failed)
        self.assertRegex(end.result['msg'], '^a value cannot hold a line break')
        self.assertEqual(self.export(), before)

    def test_a_state_file_hadrocli_cannot_read(self):
        with open(self.state, 'w') as f:
            f.write('{"version": 1,')
        end = run_module(facts, self.args())
        self.assertTrue(end.failed)
        self.assertEqual(end.result['rc'], 3)
        self.assertIn(self.state, end.result['msg'])


class ProgramTest(Scratch):
    """hadrocli stood in for by scripts: what it is given, and output it should never print."""

    def test_backend_and_state_file_pass_through(self):
        log = os.path.join(self.dir, 'log')
        fake = self.program('echo "$@" >>%s\ncat >>%s\necho "[]"\n' % (log, log))
        run_module(route, dict(hadrocli=fake, backend='linux', network='10.0.0.0/8', gateway='192.0.2.1'))
        run_module(route, dict(hadrocli=fake, backend='simulated', state_file='/tmp/h.json', network='::/0'))
        run_module(route, dict(hadrocli=fake, network='10.0.0.0/8'))
        with open(log) as f:
            self.assertEqual(f.read().splitlines(), [
                '--backend=linux --formatter=json --batch=- --atomic',
                'network ip route ipv4 list',
                '--backend=linux --batch=- --atomic',
                'network ip route ipv4 add --network=10.0.0.0/8 --gateway=192.0.2.1',
                '--backend=simulated --state=/tmp/h.json --formatter=json --batch=- --atomic',
                'network ip route ipv6 list',
                '--backend=simulated --state=/tmp/h.json --batch=- --atomic',
                'network ip route ipv6 add --network=::/0',
                '--formatter=json --batch=- --atomic',
                'network ip route ipv4 list',
                '--batch=- --atomic',
                'network ip route ipv4 add --network=10.0.0.0/8'])

    def test_output_that_does_not_fit_fails_the_task(self):
        for output, msg in (('echo "[]"', 'hadrocli gave 1 results for 2 commands'),
                            ('echo "[]"; echo "not json"', 'hadrocli printed something other than JSON')):
            end = run_module(dns, dict(hadrocli=self.program('cat >/dev/null\n' + output), servers=[]))
            self.assertTrue(end.failed)
            self.assertTrue(end.result['msg'].startswith(msg), end.result['msg'])
        end = run_module(facts, dict(hadrocli=self.program('cat >/dev/null\nexit 3\n')))
        self.assertEqual(end.result['msg'], 'hadrocli exited with status 3')

    def test_a_missing_program(self):
        end = run_module(facts, dict(hadrocli=os.path.join(self.dir, 'none')))
        self.assertEqual(end.result['msg'], 'hadrocli program %s/none is missing or not executable' % self.dir)
        end = run_module(facts, dict(hadrocli='hadrocli-that-is-not-installed'))
        self.assertEqual(end.result['msg'], "hadrocli program 'hadrocli-that-is-not-installed' not found in PATH")


if __name__ == '__main__':
    unittest.main()

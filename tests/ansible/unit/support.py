# What the unit tests of hadro.network share: the collection on the import path, the built
# programs, a scratch simulated host and running a module's main() in this process.

import json
import os
import shutil
import subprocess
import sys
import tempfile
import unittest
from unittest import mock

ROOT = os.path.abspath(os.path.join(os.path.dirname(__file__), '..', '..', '..'))
sys.path.insert(0, os.path.join(ROOT, 'ansible'))

from ansible.module_utils import basic  # noqa: E402

HADROCLI = os.environ.get('HADROCLI', os.path.join(ROOT, 'build', 'bin', 'hadrocli'))
HADROSIM = os.environ.get('HADROSIM', os.path.join(ROOT, 'build', 'bin', 'hadrosim'))
needs_programs = unittest.skipUnless(os.access(HADROCLI, os.X_OK) and os.access(HADROSIM, os.X_OK),
                                     'hadrocli and hadrosim are not built (set HADROCLI and HADROSIM)')


class Exit(Exception):
    """A module's exit_json or fail_json: the result and whether it failed."""

    def __init__(self, result, failed):
        Exception.__init__(self, result.get('msg', ''))
        self.result = result
        self.failed = failed


def run_module(module, args, check_mode=False, diff=False):
    """Runs module.main() with args; returns the Exit it ended with."""
    args = dict(args, _ansible_check_mode=check_mode, _ansible_diff=diff)

    def exit_json(self, **result):
        raise Exit(result, False)

    def fail_json(self, msg, **result):
        raise Exit(dict(result, msg=msg), True)

    with mock.patch.object(basic, '_ANSIBLE_ARGS', json.dumps({'ANSIBLE_MODULE_ARGS': args}).encode()), \
            mock.patch.object(basic.AnsibleModule, 'exit_json', exit_json), \
            mock.patch.object(basic.AnsibleModule, 'fail_json', fail_json):
        try:
            module.main()
        except Exit as end:
            return end
    raise AssertionError('the module ended without exit_json or fail_json')


class Scratch(unittest.TestCase):
    """A test with a scratch directory of its own."""

    def setUp(self):
        self.dir = tempfile.mkdtemp()
        self.addCleanup(shutil.rmtree, self.dir)

    def program(self, script):
        """A stand-in for hadrocli: a shell script in the scratch directory."""
        path = os.path.join(self.dir, 'fake-hadrocli')
        with open(path, 'w') as f:
            f.write('#!/bin/sh\n' + script)
        os.chmod(path, 0o755)
        return path


class ScratchHost(Scratch):
    """A test with a fresh simulated host."""

    def setUp(self):
        Scratch.setUp(self)
        self.state = os.path.join(self.dir, 'host.json')
        subprocess.run([HADROSIM, '--state=' + self.state, 'reset'], check=True)

    def args(self, **args):
        return dict(args, hadrocli=HADROCLI, state_file=self.state)

    def export(self):
        return subprocess.run([HADROSIM, '--state=' + self.state, 'export'], check=True,
                              stdout=subprocess.PIPE).stdout

    def hadrocli(self, *words):
        out = subprocess.run([HADROCLI, '--state=' + self.state, '--formatter=json'] + list(words),
                             check=True, stdout=subprocess.PIPE).stdout
        return json.loads(out)

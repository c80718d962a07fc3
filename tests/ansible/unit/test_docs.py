# ansible-doc reads every module, and what it reads is what the module takes: the same
# options, types, defaults and choices, and examples that use documented options only.

import json
import os
import shutil
import subprocess
import tempfile
import unittest

import yaml

from support import ROOT
from ansible_collections.hadro.network.plugins.modules import (
    dns, facts, firewall_ruleset, ip_interface, nic, portgroup, route, vswitch)

MODULES = dict((m.__name__.rsplit('.', 1)[1], m)
               for m in (dns, facts, firewall_ruleset, ip_interface, nic, portgroup, route, vswitch))
KEYS = ('type', 'required', 'default', 'choices', 'elements')


def shape(entries, nested):
    """What ansible-doc or an argument spec says of each option, in one form."""
    shaped = {}
    for name, entry in entries.items():
        shaped[name] = dict((key, entry[key]) for key in KEYS if entry.get(key) not in (None, False))
        if nested in entry:
            shaped[name]['options'] = shape(entry[nested], nested)
    return shaped


@unittest.skipUnless(shutil.which('ansible-doc'), 'ansible-doc is not installed')
class DocsTest(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        env = dict(os.environ, ANSIBLE_COLLECTIONS_PATH=os.path.join(ROOT, 'ansible'))
        out = subprocess.run(['ansible-doc', '--json'] + ['hadro.network.' + name for name in MODULES], env=env,
                             check=True, stdout=subprocess.PIPE).stdout
        cls.docs = json.loads(out)

    def test_every_module_documents_the_options_it_takes(self):
        for name, module in MODULES.items():
            doc = self.docs['hadro.network.' + name]
            self.assertEqual(shape(doc['doc']['options'], 'suboptions'), shape(module.ARGUMENT_SPEC, 'options'), name)
            self.assertTrue(doc['return'], name)

    def test_examples_use_documented_options(self):
        for name in MODULES:
            doc = self.docs['hadro.network.' + name]
            for task in yaml.safe_load(doc['examples']):
                args = task.get('hadro.network.' + name)
                if args is None:
                    continue
                self.assertLessEqual(set(args), set(doc['doc']['options']), (name, task['name']))

    def test_the_collection_builds(self):
        with tempfile.TemporaryDirectory() as out:
            subprocess.run(['ansible-galaxy', 'collection', 'build', '--output-path', out,
                            os.path.join(ROOT, 'ansible', 'ansible_collections', 'hadro', 'network')],
                           check=True, stdout=subprocess.DEVNULL)
            self.assertRegex(' '.join(os.listdir(out)), r'^hadro-network-[0-9.]+\.tar\.gz$')


if __name__ == '__main__':
    unittest.main()

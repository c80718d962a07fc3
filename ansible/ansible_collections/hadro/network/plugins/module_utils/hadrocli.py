# -*- coding: utf-8 -*-
# What every module of hadro.network shares: running hadrocli, reading its JSON, sending
# changes as one atomic batch, and the canonical forms used to compare addresses.

from __future__ import absolute_import, division, print_function
__metaclass__ = type

import ipaddress
import json
import os
import re
import shlex

# The options every module takes, passed through to hadrocli's global options.
COMMON_ARGS = dict(
    hadrocli=dict(type='str', default='hadrocli'),
    backend=dict(type='str'),
    state_file=dict(type='path'),
)

# A command option without a value (--auto).
FLAG = object()

_BATCH_TRAILER = re.compile(r'^line (\d+): ')


def argument_spec(**own):
    spec = dict(COMMON_ARGS)
    spec.update(own)
    return spec


def command(path, *options):
    """The words of one command line: the path's words, then each (name, value) option as
    --name=value (booleans as true/false; FLAG gives --name alone; None leaves it out)."""
    words = path.split()
    for name, value in options:
        if value is None:
            continue
        if value is FLAG:
            words.append('--' + name)
        elif isinstance(value, bool):
            words.append('--%s=%s' % (name, 'true' if value else 'false'))
        else:
            words.append('--%s=%s' % (name, value))
    return words


def render(words):
    """One batch line: the words quoted as hadrocli's batch splitter reads them back."""
    return ' '.join(shlex.quote(word) for word in words)


class Hadrocli(object):
    """hadrocli run for a module, with the module's backend and state file."""

    def __init__(self, module):
        self.module = module
        params = module.params
        self.program = self._find(params['hadrocli'])
        self.global_options = []
        if params.get('backend') is not None:
            self.global_options.append('--backend=' + params['backend'])
        if params.get('state_file') is not None:
            self.global_options.append('--state=' + params['state_file'])

    def _find(self, program):
        if '/' not in program:
            found = self.module.get_bin_path(program)
            if found is None:
                self.module.fail_json(msg='hadrocli program %r not found in PATH' % program)
            return found
        if not (os.path.isfile(program) and os.access(program, os.X_OK)):
            self.module.fail_json(msg='hadrocli program %s is missing or not executable' % program)
        return program

    def _run(self, args, data=None):
        return self.module.run_command([self.program] + self.global_options + args, data=data,
                                       expand_user_and_vars=False)

    def _batch(self, lines, extra=()):
        for words in lines:
            for word in words:
                if '\n' in word or '\r' in word:
                    self.module.fail_json(msg='a value cannot hold a line break: %r' % word)
        text = '\n'.join(render(words) for words in lines)
        rc, out, err = self._run(list(extra) + ['--batch=-', '--atomic'], data=text)
        if rc != 0:
            self._fail(rc, out, err, lines)
        return out

    def _fail(self, rc, out, err, lines):
        """Fails the task with the command's own messages; the batch's 'line N:' trailer
        names the command, given apart."""
        messages = err.rstrip('\n').split('\n') if err.strip() else []
        failed = None
        if messages:
            match = _BATCH_TRAILER.match(messages[-1])
            if match and 1 <= int(match.group(1)) <= len(lines):
                failed = render(lines[int(match.group(1)) - 1])
                messages.pop()
        msg = '\n'.join(messages) or 'hadrocli exited with status %d' % rc
        self.module.fail_json(msg=msg, rc=rc, stdout=out, stderr=err, failed_command=failed,
                              commands=[render(words) for words in lines])

    def read(self, lines):
        """Runs read commands in one session and returns their JSON results, in order."""
        out = self._batch(lines, ['--formatter=json'])
        docs = out.split('\n')
        if docs and docs[-1] == '':
            docs.pop()
        if len(docs) != len(lines):
            self.module.fail_json(msg='hadrocli gave %d results for %d commands' % (len(docs), len(lines)),
                                  stdout=out, commands=[render(words) for words in lines])
        try:
            return [json.loads(doc) for doc in docs]
        except ValueError as e:
            self.module.fail_json(msg='hadrocli printed something other than JSON: %s' % e, stdout=out)

    def read_one(self, words):
        return self.read([words])[0]

    def change(self, lines):
        """Applies the command lines as one transaction: all of them, or none."""
        if lines:
            self._batch(lines)


def apply(module, cli, lines, before, after, result=None):
    """Sends the planned lines (unless in check mode) and ends the task with changed, the
    commands and, in diff mode, the before and after."""
    result = dict(result or {})
    if not module.check_mode:
        cli.change(lines)
    result['changed'] = bool(lines)
    result['commands'] = [render(words) for words in lines]
    if module._diff:
        result['diff'] = dict(before=before, after=after)
    module.exit_json(**result)


# ---- canonical forms: what the host shows and what the task says compare equal ----

def canon_address(text):
    """An IP address in its compressed form; text that is not one stays as it is."""
    try:
        return ipaddress.ip_address(text).compressed
    except ValueError:
        return text


def canon_network(text):
    """An address or network as ADDRESS/PREFIX with host bits cleared, as the host keeps
    it; text that is neither stays as it is."""
    try:
        return ipaddress.ip_network(text, strict=False).with_prefixlen
    except ValueError:
        return text


def canon_interface_address(text):
    """An interface address ADDRESS/PREFIX in its compressed form (host bits kept)."""
    try:
        return ipaddress.ip_interface(text).with_prefixlen
    except ValueError:
        return text


def prefix_length(netmask):
    """The prefix length of a netmask (255.255.0.0, ffff:ffff::), or None."""
    try:
        mask = ipaddress.ip_address(netmask)
    except ValueError:
        return None
    bits = format(int(mask), '0%db' % mask.max_prefixlen)
    length = len(bits) - len(bits.lstrip('1'))
    return length if '1' not in bits[length:] else None


def find(records, field, value):
    for record in records:
        if record.get(field) == value:
            return record
    return None


def ordered_list_plan(current, desired, same=lambda a, b: a == b):
    """How to turn the ordered list current into desired, changing as little as possible:
    (to_remove, to_add). Items kept are those of the longest common prefix once the items
    not wanted are left out; everything after it is removed and added again in order."""
    def contains(items, item):
        return any(same(item, other) for other in items)

    wanted = [item for item in current if contains(desired, item)]
    keep = 0
    while keep < len(wanted) and keep < len(desired) and same(wanted[keep], desired[keep]):
        keep += 1
    kept = wanted[:keep]
    to_remove = [item for item in current if not contains(kept, item)]
    return to_remove, list(desired[keep:])

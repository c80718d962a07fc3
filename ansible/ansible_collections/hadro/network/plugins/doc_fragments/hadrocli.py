# -*- coding: utf-8 -*-
# The options every module of hadro.network takes.

from __future__ import absolute_import, division, print_function
__metaclass__ = type


class ModuleDocFragment(object):

    DOCUMENTATION = r'''
options:
  hadrocli:
    description:
      - The hadrocli program on the managed host, a path or a name looked up in C(PATH).
    type: str
    default: hadrocli
  backend:
    description:
      - The host hadrocli manages, passed as C(--backend).
      - C(simulated) is a simulated host whose whole state lives in one file; C(linux) is the
        network of the managed machine itself.
      - When not given, hadrocli's own default applies (C($HADRO_BACKEND), else C(simulated)).
      - hadrocli judges the value.
    type: str
  state_file:
    description:
      - The state file of the simulated host, passed as C(--state).
      - When not given, hadrocli's own default applies (C($HADRO_STATE), else
        C(~/.local/state/hadro/host.json)).
      - It does not go with I(backend=linux).
    type: path
notes:
  - Options are checked for their types only; hadrocli judges their values, and a value it
    refuses fails the task with hadrocli's own message.
  - All the changes a task makes are sent as one C(hadrocli --batch - --atomic) transaction, so a
    task that fails leaves the host as it was.
  - The module is in the action group C(hadro.network.hadrocli), so C(module_defaults) can set
    I(hadrocli), I(backend) and I(state_file) for all of them at once.
'''

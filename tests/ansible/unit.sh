#!/usr/bin/env bash
# Unit tests of the collection hadro.network (tests/ansible/unit), run with python3 -m unittest
# by the Python that has ansible-core.
#   unit.sh HADROCLI HADROSIM
# Exit status 77 (skipped) when no Python has ansible-core.
set -u
here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
export HADROCLI=$1 HADROSIM=$2 PYTHONDONTWRITEBYTECODE=1
unset HADRO_STATE HADRO_BACKEND
for python in python3 /usr/bin/python3; do
    if "$python" -c 'import ansible.module_utils.basic' 2>/dev/null; then
        cd "$here/unit" && exec "$python" -m unittest discover -p 'test_*.py'
    fi
done
echo "SKIP: ansible-core is not installed (apt-get install ansible-core)"
exit 77

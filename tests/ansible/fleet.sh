#!/usr/bin/env bash
# The collection hadro.network over a fleet of 20 simulated hosts, each with a state file of
# its own, driven by ansible-playbook on local connections:
#   - check mode on fresh hosts reports the changes and makes none;
#   - the common configuration (fleet/site.yml) applies on every host, in under 2 minutes;
#   - a second run changes nothing;
#   - a bad value on one host fails its task with hadrocli's message and leaves that host as
#     it was, while the others take the change.
#   fleet.sh HADROCLI HADROSIM
# Exit status 77 (skipped) when ansible-playbook is not installed. FLEET_KEEP=1 keeps the
# work directory (inventory, state files, the output of each run).
set -u
CLI=$1
SIM=$2
here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
collections=$(cd "$here/../../ansible" && pwd)
if ! command -v ansible-playbook >/dev/null; then
    echo "SKIP: ansible-playbook is not installed (apt-get install ansible-core)"
    exit 77
fi
work=$(mktemp -d)
if [ -n "${FLEET_KEEP:-}" ]; then echo "work directory: $work"; else trap 'rm -rf "$work"' EXIT; fi
unset HADRO_STATE HADRO_BACKEND
export ANSIBLE_CONFIG=$here/fleet/ansible.cfg ANSIBLE_COLLECTIONS_PATH=$collections
export ANSIBLE_LOCAL_TEMP=$work/tmp ANSIBLE_HOME=$work/home ANSIBLE_NOCOLOR=1 PYTHONDONTWRITEBYTECODE=1
HOSTS=20

passed=0
failed=0
t() {
    local name=$1
    shift
    if "$@"; then
        passed=$((passed + 1))
    else
        failed=$((failed + 1))
        echo "FAIL: $name"
    fi
}

{
    echo "[hadro_hosts]"
    for i in $(seq -w 1 $HOSTS); do
        echo "host$i ansible_connection=local hadro_state=$work/host$i.json host_index=$((10#$i + 10))"
        "$SIM" --state="$work/host$i.json" reset
    done
    echo "[hadro_hosts:vars]"
    echo "ansible_python_interpreter=\"{{ ansible_playbook_python }}\""
    echo "hadrocli=$CLI"
} >"$work/inventory"

export_all() {
    for i in $(seq -w 1 $HOSTS); do "$SIM" --state="$work/host$i.json" export >"$work/$1-host$i.json"; done
}
# play NAME ARGS...: runs ansible-playbook, its output in $work/NAME.out, its duration
# in $work/NAME.ms (milliseconds); the status is ansible-playbook's.
play() {
    local name=$1
    shift
    local start status ms
    start=$(date +%s%N)
    ansible-playbook -i "$work/inventory" "$@" >"$work/$name.out" 2>&1
    status=$?
    ms=$((($(date +%s%N) - start) / 1000000))
    echo "$ms" >"$work/$name.ms"
    printf '%-14s %3d.%d s  (exit %d)\n' "$name" $((ms / 1000)) $((ms % 1000 / 100)) "$status"
    return $status
}
# recap NAME FIELD: the FIELD counts (changed, failed, ...) of the play recap, one per host.
recap() { sed -n "s/^host[0-9]* *: .*$2=\([0-9]*\).*/\1/p" "$work/$1.out"; }
every_host() { [ "$(recap "$1" "$2" | grep -c "$3")" = $HOSTS ]; }
same_states() {
    local i
    for i in $(seq -w 1 $HOSTS); do cmp -s "$work/$1-host$i.json" "$work/$2-host$i.json" || return 1; done
}
show() { echo "--- $work/$1.out"; tail -n 40 "$work/$1.out"; }

# ---- check mode on fresh hosts ----
export_all fresh
t "check mode runs" play check --check --diff "$here/fleet/site.yml" || show check
t "check mode reports changes on every host" every_host check changed '^[1-9]'
t "check mode fails nowhere" every_host check failed '^0$'
t "check mode shows the differences" grep -q '"name": "vSwitch2"' "$work/check.out"
export_all after-check
t "check mode changes no host" same_states fresh after-check

# ---- the configuration ----
t "first run" play first "$here/fleet/site.yml" || show first
t "first run changes every host" every_host first changed '^[1-9]'
t "first run fails nowhere" every_host first failed '^0$'
t "first run takes under 2 minutes" [ "$(cat "$work/first.ms")" -lt 120000 ]
t "the host has the configuration" \
    grep -q '"Name":"tkn3".*"Portgroup":"Storage"' <("$CLI" --state="$work/host07.json" --formatter=json network ip interface list)
t "each host has its own address" \
    grep -q '"IPv4 Address":"10.30.0.17"' <("$CLI" --state="$work/host07.json" --formatter=json network ip interface ipv4 get -i tkn3)

# ---- idempotence ----
export_all first
t "second run" play second "$here/fleet/site.yml" || show second
t "second run changes nothing" every_host second changed '^0$'
t "second run fails nowhere" every_host second failed '^0$'
export_all second
t "second run leaves every state file as it was" same_states first second

# ---- check mode with changes to make ----
t "check mode with another MTU and VLAN" play check-changes --check --diff -e storage_mtu=1500 -e storage_vlan=31 \
    "$here/fleet/site.yml" || show check-changes
t "check mode predicts the changes" grep -q -- '-    "mtu": 9000,' "$work/check-changes.out"
export_all after-check-changes
t "check mode with changes changes no host" same_states second after-check-changes

# ---- a bad value on one host ----
cat >"$work/bad.yml" <<'EOF'
- hosts: hadro_hosts
  gather_facts: false
  tasks:
    - hadro.network.vswitch:
        hadrocli: "{{ hadrocli }}"
        state_file: "{{ hadro_state }}"
        name: vSwitch3
        uplinks: [vmnic4]
        mtu: "{{ 19000 if inventory_hostname == 'host07' else 9000 }}"
EOF
play bad "$work/bad.yml"
t "a bad value fails the run" [ $? -ne 0 ]
t "the bad value fails its host only" [ "$(recap bad failed | tr -d '\n')" = "00000010000000000000" ]
t "the failure says hadrocli's message" grep -q \
    '^fatal: \[host07\]: FAILED! .*"msg": "Unable to set the MTU of virtual switch vSwitch3: the MTU must be between 1280 and 9000"' \
    "$work/bad.out"
export_all bad
t "the failing host is left as it was (no switch added, no uplink taken)" cmp -s "$work/second-host07.json" "$work/bad-host07.json"
t "the other hosts take the change" grep -q '"Name":"vSwitch3"' <("$CLI" --state="$work/host08.json" --formatter=json network vswitch standard list)

echo "ansible fleet: $passed passed, $failed failed ($HOSTS hosts)"
[ "$failed" -eq 0 ]

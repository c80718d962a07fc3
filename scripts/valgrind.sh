#!/usr/bin/env bash
# Memory check of the real programs: hadrocli and hadrosim run under valgrind memcheck over
# the help of every command, a set of reads and changes in every formatter, refused command
# lines, injected faults and damaged state files. Any memory error or leak fails the run.
#   scripts/valgrind.sh [BUILD_DIR]      (default: build, the release build)
set -euo pipefail
root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build=${1:-$root/build}
cli="$build/bin/hadrocli"
sim="$build/bin/hadrosim"
[ -x "$cli" ] && [ -x "$sim" ] || { echo "build $build first (scripts/build.sh)" >&2; exit 1; }
command -v valgrind >/dev/null || { echo "valgrind is not installed (scripts/install-deps.sh)" >&2; exit 1; }

work=$(mktemp -d "${TMPDIR:-/tmp}/hadro-valgrind.XXXXXX")
trap 'rm -rf "$work"' EXIT
export HADRO_STATE="$work/host.json"
"$sim" reset

# One command line per line; the words are separated by tabs.
lines="$work/lines"
{
    "$cli" --list-commands | cut -f1 | sed 's/$/ --help/' | tr ' ' '\t'
    cat <<'LIST' | tr ' ' '\t'
network ip interface list
--formatter=json network ip interface ipv4 get
--formatter=table network ip interface ipv6 address list
network ip interface add -i tkn9 -p Management Network
network ip interface ipv4 set -i tkn1 -t static -I 10.20.30.9 -N 255.255.255.0
network ip interface tag add -i tkn1 -t Glidex
network ip route ipv4 add -n 10.99.0.0/16 -g 10.20.30.1
network ip route ipv4 list
network ip dns server add -s 10.0.0.99
network ip dns search list
network ip neighbor list
--formatter=json network ip connection list
network ip netstack list
network ip ipsec sa list
network firewall get
--formatter=table network firewall ruleset list
network firewall ruleset allowedip add -r sshServer -i 10.8.0.0/16
network firewall ruleset rule list
network firewall refresh
network ens maxlcores get
network nic list
--formatter=json network nic get -n vmnic0
network nic stats get -n vmnic0
network nic sriov vf list -n vmnic2
network vswitch standard list
network vswitch standard portgroup add -p Lab -v vSwitch0
network vswitch standard portgroup policy failover get -p Lab
--formatter=json network vswitch dvs talvex list
network vswitch dvs talvex lacp status get
network port stats get -p 33554436
network vm list
network vm port list -w 2110598
network ip interface add -i tkn1 -p Nowhere
network nic get -n vmnic99
network ip route ipv4 add -n not-a-network -g 10.20.30.1
network vswitch standard set -v vSwitch0 -m 99999999999999999999
network nic list --bogus
LIST
} >"$lines"

run() {   # run NAME PROGRAM ARGS...: the program under memcheck; status 0, 1 or 2 is fine
    local name=$1
    shift
    local status=0
    valgrind --quiet --error-exitcode=99 --leak-check=full --errors-for-leak-kinds=definite,indirect,possible \
        --show-leak-kinds=definite,indirect,possible --log-file="$work/vg.%p" "$@" >/dev/null 2>&1 || status=$?
    if [ "$status" -gt 2 ]; then
        echo "FAIL ($status): $name"
        cat "$work"/vg.* 2>/dev/null | head -60
        return 1
    fi
    rm -f "$work"/vg.*
}

failed=0
count=0
while IFS= read -r line; do
    IFS=$'\t' read -r -a words <<<"$line"
    run "hadrocli ${words[*]}" "$cli" "${words[@]}" || failed=$((failed + 1))
    count=$((count + 1))
done <"$lines"

# Faults, the journal and hadrosim itself.
"$sim" export >"$work/export.json"
for step in "fault add TknCtl::Network::DnsConfigImpl::SaveConfig --message injected" "journal on" \
    "export" "import $work/export.json" "journal show" "fault list" "fault clear"; do
    read -r -a words <<<"$step"
    run "hadrosim ${words[*]}" "$sim" "${words[@]}" || failed=$((failed + 1))
    count=$((count + 1))
done
run "hadrocli under a fault" "$cli" network ip dns server add -s 10.0.0.77 || failed=$((failed + 1))

# Damaged state files are refused (status 3) without errors or leaks.
for damage in empty garbage truncated; do
    case $damage in
    empty) : >"$work/bad.json" ;;
    garbage) head -c 512 /dev/urandom >"$work/bad.json" ;;
    truncated) head -c 2000 "$HADRO_STATE" >"$work/bad.json" ;;
    esac
    status=0
    valgrind --quiet --error-exitcode=99 --leak-check=full --errors-for-leak-kinds=definite,indirect,possible \
        "$cli" --state="$work/bad.json" network nic list >/dev/null 2>"$work/err" || status=$?
    if [ "$status" -ne 3 ]; then
        echo "FAIL ($status): damaged ($damage) state file"
        head -40 "$work/err"
        failed=$((failed + 1))
    fi
    count=$((count + 1))
done

echo "valgrind memcheck: $count runs, $failed with errors"
[ "$failed" -eq 0 ]

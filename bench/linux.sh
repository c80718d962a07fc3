#!/usr/bin/env bash
# The Linux host against the kernel's own tool: hadrocli --backend=linux and `ip -j` reading the
# same host, interleaved in one run, in network namespaces this script builds (the machine's own
# network is never touched). For each size N (default 50, 200 and 800 interfaces) a fresh
# namespace gets N/2 veth pairs, one IPv4 and one IPv6 address on each interface and ten IPv4
# routes through each.
#
#   bench/linux.sh [BUILD_DIR] [--sizes "50 200 800"] [--runs 30]
#
# Needs root (it makes namespaces) and python3. Prints a table: median ms of each command,
# hadrocli's ratio to ip, and the cost per interface as the host grows.
set -euo pipefail
here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)

if [ "${1:-}" = "--inside" ]; then
    # In the namespaces of one size: build the host, then time both programs on it.
    n=$2 cli=$3 runs=$4 out=$5
    mount --make-rprivate /
    mount -t tmpfs tmpfs /run && mkdir /run/netns
    mount -t sysfs sysfs /sys
    # No duplicate address detection: addresses settle at once, and no dump meets a table changing.
    sysctl -qw net.ipv6.conf.all.accept_dad=0 net.ipv6.conf.default.accept_dad=0
    python3 "$here/linux_host.py" build "$n" | ip -batch -
    python3 "$here/linux_host.py" time "$n" "$cli" "$runs" >>"$out"
    exit 0
fi

build=$(cd "$here/.." && pwd)/build
sizes="50 200 800"
runs=30
while [ $# -gt 0 ]; do
    case $1 in
        --sizes) sizes=$2; shift ;;
        --runs) runs=$2; shift ;;
        *) build=$1 ;;
    esac
    shift
done
cli=$build/bin/hadrocli
[ -x "$cli" ] || { echo "linux.sh: build hadrocli in $build first" >&2; exit 2; }
[ "$(id -u)" = 0 ] || { echo "linux.sh: needs root to build network namespaces" >&2; exit 2; }
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
: >"$work/linux.conf"
export HADRO_LINUX_CONF=$work/linux.conf HADRO_LINUX_STATE=$work/linux.json
for n in $sizes; do
    unshare -n -m "$here/linux.sh" --inside "$n" "$cli" "$runs" "$work/results.tsv"
done
python3 "$here/linux_host.py" report "$work/results.tsv"

#!/usr/bin/env bash
# Whole-process benchmarks of hadrocli, measured in one run on this machine:
#   - read and change commands on the default host against /bin/true and `ip -j addr show`,
#     and against programs built like hadrocli that only start (bench/start_*.cpp);
#   - every list command (and a change) on the scale-1 host, against the 25 ms target;
#   - how many times a change on the scale-1 host writes the state file;
#   - the growth of cost from scale 0.25 to 4;
#   - read commands per second in batch mode.
#
#   bench/run.sh [BUILD_DIR] [--quick]
#
# Uses hyperfine when it is installed (medians of many runs), else a plain loop timed with
# bash's clock. Prints a report; the raw medians stay in $BENCH_OUT (default: a temporary
# directory, removed at the end).
set -euo pipefail
root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build=$root/build
quick=0
for arg in "$@"; do
    case $arg in
        --quick) quick=1 ;;
        *) build=$arg ;;
    esac
done
cli=$build/bin/hadrocli
sim=$build/bin/hadrosim
[ -x "$cli" ] && [ -x "$sim" ] || { echo "run.sh: build hadrocli and hadrosim in $build first" >&2; exit 2; }
work=$(mktemp -d)
keep=${BENCH_OUT:-}
trap '[ -n "$keep" ] || rm -rf "$work"' EXIT
[ -n "$keep" ] && { mkdir -p "$keep"; work=$keep; }
results=$work/results.tsv
: >"$results"
runs() { if [ $quick = 1 ]; then echo $(( ($1 + 4) / 5 )); else echo "$1"; fi; }

# measure NAME RUNS PREPARE COMMAND...: the median wall time of COMMAND in ms, and with
# hyperfine its mean CPU time (user and system; steadier than wall time on a busy machine),
# appended to results.tsv. PREPARE (a shell command, may be empty) runs before each run,
# untimed.
measure() {
    local name=$1 n=$2 prepare=$3
    shift 3
    local median cpu=""
    if command -v hyperfine >/dev/null; then
        local quoted=() arg
        for arg in "$@"; do quoted+=("$(printf '%q' "$arg")"); done
        local options=(-N --style none --warmup 3 --runs "$n" --export-json "$work/h.json")
        [ -n "$prepare" ] && options+=(--prepare "$prepare")
        hyperfine "${options[@]}" "${quoted[*]}" >/dev/null 2>&1 || {
            echo "run.sh: '$*' failed" >&2
            "$@" >/dev/null
            exit 1
        }
        read -r median cpu < <(python3 -c 'import json,sys; r=json.load(open(sys.argv[1]))["results"][0]; print(r["median"]*1e3, (r["user"]+r["system"])*1e3)' "$work/h.json")
    else
        local times=() i s e
        for ((i = 0; i < 3; i++)); do [ -n "$prepare" ] && eval "$prepare"; "$@" >/dev/null 2>&1 || true; done
        for ((i = 0; i < n; i++)); do
            [ -n "$prepare" ] && eval "$prepare"
            s=$EPOCHREALTIME
            "$@" >/dev/null 2>&1 || true
            e=$EPOCHREALTIME
            times+=("$(echo "($e - $s) * 1000" | bc -l)")
        done
        median=$(printf '%s\n' "${times[@]}" | sort -g | awk '{a[NR]=$1} END {print (NR%2 ? a[(NR+1)/2] : (a[NR/2]+a[NR/2+1])/2)}')
    fi
    printf '%s\t%s\t%s\n' "$name" "$median" "$cpu" >>"$results"
}

hosts=$work/hosts
mkdir -p "$hosts"
HADRO_STATE=$hosts/default.json "$sim" reset
for scale in 0.25 0.5 1 2 4; do HADRO_STATE=$hosts/scale-$scale.json "$sim" generate --scale $scale; done

# Default host: reads, a change, and the references.
default=$hosts/default.json
measure "ref /bin/true" "$(runs 300)" "" /bin/true
if command -v ip >/dev/null; then measure "ref ip -j addr show" "$(runs 300)" "" ip -j addr show; fi
# What any program built like hadrocli pays to start, and with its two libraries loaded.
[ -x "$build/bin/start_floor" ] && measure "ref a C++ program that only starts" "$(runs 300)" "" "$build/bin/start_floor"
[ -x "$build/bin/start_libs" ] && measure "ref ... with the framework and host-control libraries" "$(runs 300)" "" \
    "$build/bin/start_libs"
for line in "network ip interface list" "network nic list" "network ip dns server list" "network vswitch standard list" \
    "--list-commands"; do
    read -ra words <<<"$line"
    measure "default read: $line" "$(runs 300)" "" "$cli" --state="$default" "${words[@]}"
done
measure "default read: --formatter=json network vswitch dvs talvex list" "$(runs 300)" "" \
    "$cli" --state="$default" --formatter=json network vswitch dvs talvex list
cp "$default" "$work/change.json"
measure "default change: network ip dns search add -d bench.example" "$(runs 100)" "sh -c 'cp $default $work/change.json && sync'" \
    "$cli" --state="$work/change.json" network ip dns search add -d bench.example

# Scale-1 host: every list command, and changes. A change starts from a fresh copy of the
# state, flushed to disk before the run: its own write and fsync are timed, not the copy's.
scale1=$hosts/scale-1.json
declare -A needs=(
    ["network firewall ruleset rule list"]="--ruleset-id service0007"
    ["network firewall ruleset allowedip list"]="--ruleset-id service0003"
    ["network vm port list"]="--world-id 3000007"
    ["network sriovnic vf list"]="--nic-name vmnic5"
)
while IFS=$'\t' read -r path _; do
    [[ $path == *" list" ]] || continue
    read -ra words <<<"$path ${needs[$path]:-}"
    measure "scale-1 list: ${words[*]}" "$(runs 20)" "" "$cli" --state="$scale1" "${words[@]}"
done < <("$cli" --list-commands)
cp "$scale1" "$work/change.json"
measure "scale-1 change: network ip dns search add -d bench.example" "$(runs 20)" "sh -c 'cp $scale1 $work/change.json && sync'" \
    "$cli" --state="$work/change.json" network ip dns search add -d bench.example
measure "scale-1 change: network vswitch standard portgroup add -p Bench -v vSwitch2" "$(runs 20)" \
    "sh -c 'cp $scale1 $work/change.json && sync'" \
    "$cli" --state="$work/change.json" network vswitch standard portgroup add -p Bench -v vSwitch2

# How often a change writes the state file: renames of a temporary file over it.
writes=""
if command -v strace >/dev/null; then
    cp "$scale1" "$work/change.json"
    strace -f -qq -e trace=rename,renameat,renameat2 -o "$work/strace" \
        "$cli" --state="$work/change.json" network vswitch standard portgroup add -p Bench -v vSwitch2
    writes=$(grep -c 'rename' "$work/strace" || true)
fi

# Growth from scale 0.25 to 4.
growth=("network ip connection list" "network ip neighbor list" "network ip route ipv4 list" "network vm list"
    "network firewall ruleset list" "network vswitch standard portgroup list" "network vswitch dvs talvex list"
    "network ip dns server list")
for scale in 0.25 0.5 1 2 4; do
    for line in "${growth[@]}"; do
        read -ra words <<<"$line"
        measure "growth $scale: $line" "$(runs 10)" "" "$cli" --state="$hosts/scale-$scale.json" "${words[@]}"
    done
done

# Batch mode: read commands on the default host.
lines=20000
python3 - "$work/batch" "$lines" <<'PY'
import sys
reads = ["network ip dns server list", "network nic get -n vmnic1", "network ip interface ipv4 get -i tkn0",
         "network vswitch standard portgroup list", "network ip netstack list"]
with open(sys.argv[1], "w") as f:
    for i in range(int(sys.argv[2])):
        f.write(reads[i % len(reads)] + "\n")
PY
measure "batch: $lines read lines" "$(runs 5)" "" "$cli" --state="$default" --batch "$work/batch"

python3 - "$results" "$writes" "$lines" "$hosts" <<'PY'
import os, sys
rows = [line.rstrip("\n").split("\t") for line in open(sys.argv[1])]
t = {r[0]: float(r[1]) for r in rows}
c = {r[0]: float(r[2]) for r in rows if len(r) > 2 and r[2]}
def cpu(name, base=None):
    if name not in c: return ""
    return f"  cpu {c[name]:7.2f}" + (f" x{c[name] / c[base]:5.2f}" if base in c else "")
writes, lines, hosts = sys.argv[2], int(sys.argv[3]), sys.argv[4]
true = t["ref /bin/true"]
print(f"Machine: {os.cpu_count()} CPUs; wall: median ms, ratio to /bin/true; cpu: mean user+system ms, ratio")
print("\nDefault host")
for name, ms in t.items():
    if name.startswith(("ref ", "default ")):
        print(f"  {name:<72} {ms:8.2f}  x{ms / true:5.2f}{cpu(name, 'ref /bin/true')}")
print("\nScale-1 host (target: every command under 25 ms)")
scale = {n: v for n, v in t.items() if n.startswith("scale-1 ")}
for name, ms in sorted(scale.items(), key=lambda x: -x[1]):
    print(f"  {name:<72} {ms:8.2f}{cpu(name)}{'  OVER' if ms >= 25 else ''}")
print(f"  slowest: {max(scale.values()):.2f} ms")
if writes:
    print(f"  state file writes (renames) of one change: {writes}")
growthOf = (lambda n: c[n]) if c else (lambda n: t[n])
print(f"\nGrowth ({'cpu' if c else 'wall'} ms; ratio to scale 1; state file size)")
scales = ["0.25", "0.5", "1", "2", "4"]
sizes = {s: os.path.getsize(f"{hosts}/scale-{s}.json") for s in scales}
print("  " + " " * 44 + "".join(f"{s:>14}" for s in scales))
print("  " + f"{'state file (MB)':<44}" + "".join(f"{sizes[s] / 1e6:14.2f}" for s in scales))
for line in sorted({n.split(": ", 1)[1] for n in t if n.startswith("growth ")}):
    row = [growthOf(f"growth {s}: {line}") for s in scales]
    base = growthOf(f"growth 1: {line}")
    print("  " + f"{line:<44}" + "".join(f"{v:8.2f} x{v / base:4.2f}" for v in row))
b = t[f"batch: {lines} read lines"]
print(f"\nBatch: {lines} read lines in {b:.0f} ms: {lines / b * 1000:,.0f} commands/s")
PY

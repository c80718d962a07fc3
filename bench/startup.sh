#!/usr/bin/env bash
# Whole-process cost of hadrocli against /bin/true, measured in one run.
#   bench/startup.sh [BUILD_DIR] [-- extra hadrocli arguments]
# Uses hyperfine when it is installed, else a plain loop. Prints medians and the ratio.
set -euo pipefail
root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build=${1:-$root/build}
shift || true
[ "${1:-}" = "--" ] && shift
args=("$@")
[ ${#args[@]} -eq 0 ] && args=(--list-commands)
cli="$build/bin/hadrocli"
state=$(mktemp -d)/host.json
export HADRO_STATE=$state
"$cli" "${args[@]}" >/dev/null 2>&1 || true   # creates the state on first use

if command -v hyperfine >/dev/null; then
    hyperfine -N --warmup 20 --runs 300 --export-json "$state.bench.json" \
        "/bin/true" "$cli ${args[*]}" >/dev/null
    python3 - "$state.bench.json" <<'PY'
import json, sys
r = json.load(open(sys.argv[1]))["results"]
base = r[0]["median"]
for x in r:
    print(f'{x["command"]:<60} median {x["median"]*1e3:7.3f} ms  ratio {x["median"]/base:5.2f}')
PY
else
    n=300
    t() { local s e; s=$(date +%s%N); for ((i = 0; i < n; i++)); do "$@" >/dev/null 2>&1; done; e=$(date +%s%N); echo $(((e - s) / n)); }
    a=$(t /bin/true); b=$(t "$cli" "${args[@]}")
    printf '%-60s mean %7.3f ms\n' /bin/true "$(echo "$a/1000000" | bc -l)" "$cli ${args[*]}" "$(echo "$b/1000000" | bc -l)"
    printf 'ratio %.2f\n' "$(echo "$b/$a" | bc -l)"
fi

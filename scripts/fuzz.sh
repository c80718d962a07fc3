#!/usr/bin/env bash
# Fuzzes each libFuzzer target for a bounded time, starting from its checked-in corpus.
#   scripts/fuzz.sh [SECONDS_PER_TARGET] [BUILD_DIR]      (defaults: 20, build-asan)
# The targets are built by the sanitizer build when the compiler is clang. New inputs go to
# a scratch corpus, so the checked-in seeds stay as they are; a crashing input is kept under
# the scratch directory and named in the output (add it to the corpus as a regression case
# once the fault is fixed).
set -euo pipefail
root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
seconds=${1:-20}
build=${2:-$root/build-asan}
scratch=$(mktemp -d "${TMPDIR:-/tmp}/hadro-fuzz.XXXXXX")
status=0
found=0
for target in cmdline state address command; do
    bin="$build/bin/${target}_fuzz"
    [ -x "$bin" ] || continue
    found=$((found + 1))
    mkdir -p "$scratch/$target/corpus" "$scratch/$target/crashes"
    echo "fuzzing $target for ${seconds}s"
    if ! (cd "$scratch/$target" && "$bin" -max_total_time="$seconds" -timeout=10 -rss_limit_mb=2048 \
        -artifact_prefix="$scratch/$target/crashes/" -print_final_stats=1 \
        corpus "$root/tests/fuzz/corpus/$target" >log 2>&1); then
        echo "FAULT in $target: see $scratch/$target/log and $scratch/$target/crashes/"
        tail -n 40 "$scratch/$target/log"
        status=1
    else
        grep -E '^stat::number_of_executed_units|^Done' "$scratch/$target/log" | tr '\n' ' '
        echo
    fi
done
if [ "$found" -eq 0 ]; then
    echo "no fuzz targets in $build (they need the sanitizer build with clang)" >&2
    exit 1
fi
[ "$status" -eq 0 ] && rm -rf "$scratch"
exit "$status"

#!/usr/bin/env bash
# Configures and builds the project.
#   scripts/build.sh              release build in build/
#   scripts/build.sh --sanitize   AddressSanitizer + UndefinedBehaviorSanitizer build in build-asan/
#                                 (with clang, which also builds the fuzz targets)
set -euo pipefail
root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
"$root/scripts/install-deps.sh"

dir="$root/build"
args=(-DCMAKE_BUILD_TYPE=Release)
while [ $# -gt 0 ]; do
    case "$1" in
        --sanitize)
            dir="$root/build-asan"
            args=(-DCMAKE_BUILD_TYPE=Debug -DHADRO_SANITIZE=ON)
            if command -v clang++ >/dev/null; then args+=(-DCMAKE_CXX_COMPILER=clang++); fi
            ;;
        --dir) dir="$2"; shift ;;
        *) args+=("$1") ;;
    esac
    shift
done

generator=()
command -v ninja >/dev/null && generator=(-G Ninja)
if [ ! -f "$dir/CMakeCache.txt" ]; then
    cmake -S "$root" -B "$dir" "${generator[@]}" "${args[@]}" >/dev/null
fi
jobs=$(nproc 2>/dev/null || echo 2)
cmake --build "$dir" --parallel "$jobs"

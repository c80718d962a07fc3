#!/usr/bin/env bash
# Builds the Debian package of hadrocli, hadrosim, their libraries, the network plug-in, the
# man page and the shell completions; prints the path of the .deb.
#   scripts/package.sh [BUILD_DIR]     (default: build/, configured as a release build if new)
set -euo pipefail
root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
dir=${1:-$root/build}
if [ ! -f "$dir/CMakeCache.txt" ]; then
    cmake -S "$root" -B "$dir" -G Ninja -DCMAKE_BUILD_TYPE=Release -DHADRO_BENCH=OFF >/dev/null
fi
cmake --build "$dir" --parallel "${HADRO_JOBS:-2}" --target hadrocli hadrosim network hostctl_linux hadro_generated >/dev/null
# Only what the package holds is built (install does not depend on "all").
rm -rf "$dir/package"
(cd "$dir" && cpack -G DEB >/dev/null)
ls "$dir"/package/*.deb

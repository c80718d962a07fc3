#!/usr/bin/env bash
# Builds the Debian package from BUILD_DIR, unpacks it into a scratch root (dpkg -x, no root
# needed) and runs the installed programs from there, with nothing of the build tree in reach.
set -euo pipefail
build=$(cd "$1" && pwd)
here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
deb=$("$here/../../scripts/package.sh" "$build" | tail -n 1)
scratch=$(mktemp -d)
trap 'rm -rf "$scratch"' EXIT
fail() { echo "FAIL: $*" >&2; exit 1; }

dpkg-deb -f "$deb" Package Version Depends
[ -n "$(dpkg-deb -f "$deb" Depends)" ] || fail "the package declares no dependencies"
dpkg -x "$deb" "$scratch/root"
usr="$scratch/root/usr"
for file in bin/hadrocli bin/hadrosim lib/libzorbel.so lib/libhostctl.so lib/hadro/plugins/libnetwork.so \
    share/man/man1/hadrocli.1.gz share/bash-completion/completions/hadrocli share/zsh/vendor-completions/_hadrocli; do
    [ -f "$usr/$file" ] || fail "the package lacks $file"
done

# The man page reads without a warning.
if command -v groff >/dev/null; then
    warnings=$(gzip -dc "$usr/share/man/man1/hadrocli.1.gz" | groff -man -Tutf8 -ww -z 2>&1)
    [ -z "$warnings" ] || fail "man page: $warnings"
fi

# The programs find their libraries and the plug-in beside themselves.
run() { env -i HOME="$scratch/home" PATH=/usr/bin:/bin "$@"; }
libraries=$(ldd "$usr/bin/hadrocli")
[[ $libraries == *"libzorbel.so => $usr/bin/../lib/libzorbel.so"* ]] || fail "libzorbel not found beside hadrocli"
out=$(run "$usr/bin/hadrocli" --state="$scratch/host.json" network ip interface list 2>&1) ||
    fail "hadrocli network ip interface list: $out"
grep -q "^Name: *tkn0\|tkn0" <<< "$out" || fail "no tkn0 in: $out"
exported=$(run "$usr/bin/hadrosim" --state="$scratch/host.json" export) || fail "hadrosim export"
[[ $exported == *'"version"'* ]] || fail "hadrosim export printed no state"
[ "$(stat -c %a "$scratch/host.json")" = 600 ] || fail "the state file is not private"

# The installed completion completes from the installed tree and the host's names.
words=$(run bash -c 'source "$1/share/bash-completion/completions/hadrocli"
    COMP_WORDS=("$1/bin/hadrocli" --state="$2" network ip interface set --interface-name ""); COMP_CWORD=7
    _hadrocli; echo "${COMPREPLY[*]}"' _ "$usr" "$scratch/host.json")
[[ $words == *tkn0* ]] || fail "completion of interface names gave: $words"
echo "package $(basename "$deb") installs and runs"

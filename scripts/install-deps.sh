#!/usr/bin/env bash
# Installs the Debian packages the build and the tests need. Safe to run again:
# it installs only what is missing.
set -euo pipefail

packages=(cmake g++ ninja-build pkg-config libboost1.81-dev nlohmann-json3-dev libgtest-dev libgmock-dev
          libbenchmark-dev clang libclang-rt-dev valgrind zsh
          # the Linux host: netlink, ethtool, xfrm, sock_diag, nftables
          libnl-3-dev libnl-route-3-dev libnl-genl-3-dev libnl-xfrm-3-dev libnl-idiag-3-dev libnftables-dev
          # the tools its tests ask for the kernel's own view
          iproute2 nftables ethtool util-linux
          # the Ansible collection (ansible/) and its tests
          ansible-core)

missing=()
for p in "${packages[@]}"; do
    if ! dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed"; then
        missing+=("$p")
    fi
done
[ ${#missing[@]} -eq 0 ] && exit 0

echo "install-deps: installing ${missing[*]}" >&2
sudo_cmd=()
if [ "$(id -u)" -ne 0 ]; then sudo_cmd=(sudo); fi
export DEBIAN_FRONTEND=noninteractive
if ! "${sudo_cmd[@]}" apt-get install -y --no-install-recommends "${missing[@]}"; then
    "${sudo_cmd[@]}" apt-get update
    "${sudo_cmd[@]}" apt-get install -y --no-install-recommends "${missing[@]}"
fi

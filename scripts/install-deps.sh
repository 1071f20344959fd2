#!/usr/bin/env bash
# Installs what building and testing midebug needs on Debian 12, when missing.
set -euo pipefail

packages=(cmake ninja-build g++ clang libclang-rt-14-dev gdb fpc libgtest-dev libgmock-dev libbenchmark-dev nlohmann-json3-dev pkg-config)
# The debug adapter's tests run on node; the machine's own node is used where there is one.
command -v node >/dev/null 2>&1 || packages+=(nodejs npm)
missing=()
for package in "${packages[@]}"; do
  dpkg-query -W -f='${Status}' "$package" 2>/dev/null | grep -q "install ok installed" || missing+=("$package")
done
[ ${#missing[@]} -eq 0 ] && exit 0

sudo=""
[ "$(id -u)" -ne 0 ] && sudo="sudo"
echo "Installing: ${missing[*]}"
$sudo apt-get update -qq
DEBIAN_FRONTEND=noninteractive $sudo apt-get install -y -qq --no-install-recommends "${missing[@]}"

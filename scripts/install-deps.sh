#!/usr/bin/env bash
# Installs the Debian packages that building and testing need, when any is missing.
# Usage: scripts/install-deps.sh [extra package...]
# As root it runs apt-get; otherwise it prints the exact command and fails.
set -euo pipefail

packages=(
    g++ clang cmake ninja-build pkgconf make
    libboost-thread-dev libboost-system-dev libboost-stacktrace-dev
    libxerces-c-dev libexpat1-dev libgtest-dev libgmock-dev
    libcli11-dev nlohmann-json3-dev
    "$@"
)

missing=()
for package in "${packages[@]}"; do
    status=$(dpkg-query -W -f='${db:Status-Status}' "$package" 2>/dev/null || true)
    [ "$status" = installed ] || missing+=("$package")
done

[ ${#missing[@]} -eq 0 ] && exit 0

command=(apt-get install -y --no-install-recommends "${missing[@]}")
if [ "$(id -u)" -ne 0 ]; then
    echo "Missing packages. Run as root:" >&2
    echo "  apt-get update && ${command[*]}" >&2
    exit 1
fi
echo "Installing: ${missing[*]}"
export DEBIAN_FRONTEND=noninteractive
apt-get update -qq
"${command[@]}"

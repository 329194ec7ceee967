#!/usr/bin/env bash
# Installs the Debian packages mcsim builds and tests with, and only those that are missing.
# Safe to run again: a machine that has everything is left untouched.
set -euo pipefail

packages=(
    build-essential
    cmake
    make
    pkg-config
    googletest
    libgtest-dev
    libgmock-dev
    libbenchmark-dev
    libxerces-c-dev
    libboost-dev
    libeigen3-dev
    libnlopt-cxx-dev
    libcli11-dev
    libmuparser-dev
    nlohmann-json3-dev
    clang
)

missing=()
for p in "${packages[@]}"; do
    if ! dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q 'install ok installed'; then
        missing+=("$p")
    fi
done

if [ ${#missing[@]} -eq 0 ]; then
    exit 0
fi

echo "install-deps: installing ${missing[*]}"
sudo_cmd=()
if [ "$(id -u)" -ne 0 ]; then
    sudo_cmd=(sudo)
fi
export DEBIAN_FRONTEND=noninteractive
"${sudo_cmd[@]}" apt-get update -qq
"${sudo_cmd[@]}" apt-get install -y -qq --no-install-recommends "${missing[@]}"

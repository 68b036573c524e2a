#!/usr/bin/env bash
# Installs what a fresh Debian machine lacks to build, test and benchmark sarn.
# Only missing packages are installed; needs root (or sudo) when something is missing.
set -euo pipefail

packages=(g++ cmake make pkg-config libyajl-dev zlib1g-dev libgtest-dev libbenchmark-dev
          clang libclang-rt-14-dev rapidjson-dev libhttp-parser-dev libprotobuf-dev protobuf-compiler ccache
          doxygen)

missing=()
for package in "${packages[@]}"; do
  if ! dpkg-query -W -f='${Status}' "$package" 2>/dev/null | grep -q 'install ok installed'; then
    missing+=("$package")
  fi
done

if [ ${#missing[@]} -eq 0 ]; then
  exit 0
fi

echo "setup: installing ${missing[*]}"
as_root=()
if [ "$(id -u)" -ne 0 ]; then as_root=(sudo); fi
export DEBIAN_FRONTEND=noninteractive
"${as_root[@]}" apt-get update -qq
"${as_root[@]}" apt-get install -y -qq --no-install-recommends "${missing[@]}"

#!/usr/bin/env bash
# Installs the Debian packages Varnel builds and tests with, when any is missing:
# the compilers, the libraries, and clang's sanitizer and libFuzzer runtimes.
# Arguments name other packages to install instead (scripts/windows.sh).
set -euo pipefail
packages=(cmake g++ make libpugixml-dev libgtest-dev libgmock-dev libbenchmark-dev libcli11-dev nlohmann-json3-dev
          clang libclang-rt-14-dev libxml2-dev python3 python3-pytest)
missing=()
# pkg-config: the C example is built through it against the installed package.
packages+=(pkg-config)
[ $# -gt 0 ] && packages=("$@")
for p in "${packages[@]}"; do
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
done
if [ ${#missing[@]} -gt 0 ]; then
  echo "Installing: ${missing[*]}"
  SUDO=""; [ "$(id -u)" -ne 0 ] && SUDO=sudo
  $SUDO apt-get update -qq
  DEBIAN_FRONTEND=noninteractive $SUDO apt-get install -y -qq "${missing[@]}"
fi

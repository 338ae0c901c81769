#!/usr/bin/env bash
# Builds the API reference from the public headers into build/docs/html,
# installing doxygen when it is missing. Every doxygen warning is an error here
# (VARNEL_WERROR), so a header whose contract doxygen cannot read fails it.
set -euo pipefail
cd "$(dirname "$0")/.."
bash scripts/deps.sh docs >&2
# Configures anew, so a doxygen installed just now is found; other settings of build/ stay.
cmake -S . -B build -DVARNEL_WERROR=ON >/dev/null
cmake --build build --target docs

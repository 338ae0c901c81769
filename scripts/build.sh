#!/usr/bin/env bash
# Configures and builds Varnel into build/ (warnings are errors), the benchmark
# program included so that it cannot rot. Arguments name the targets to build
# (all by default). Build output goes to standard error.
set -euo pipefail
cd "$(dirname "$0")/.."
bash scripts/deps.sh >&2
cmake -S . -B build -DCMAKE_BUILD_TYPE=RelWithDebInfo -DVARNEL_WERROR=ON -DVARNEL_BUILD_BENCHMARKS=ON >/dev/null
targets=()
for t in "$@"; do targets+=(--target "$t"); done
cmake --build build -j"$(nproc)" "${targets[@]}" >&2

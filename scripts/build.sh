#!/usr/bin/env bash
# Configures and builds Varnel into build/ (warnings are errors). Arguments
# name the targets to build (all by default). VARNEL_BENCH=1 adds the benchmark
# program. Build output goes to standard error.
set -euo pipefail
cd "$(dirname "$0")/.."
bash scripts/deps.sh >&2
bench=OFF
[ "${VARNEL_BENCH:-0}" = 1 ] && bench=ON
cmake -S . -B build -DCMAKE_BUILD_TYPE=RelWithDebInfo -DVARNEL_WERROR=ON -DVARNEL_BUILD_BENCHMARKS=$bench >/dev/null
targets=()
for t in "$@"; do targets+=(--target "$t"); done
cmake --build build -j"$(nproc)" "${targets[@]}" >&2

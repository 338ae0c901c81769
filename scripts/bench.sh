#!/usr/bin/env bash
# Builds the benchmarks in Release (build-bench/) and runs them: medians of 15
# repetitions, interleaved so that a change in the machine's load falls on every
# benchmark alike. The figures printed last (ratios and allocations per record)
# are taken within this one run; docs/performance.md says how to read them.
# Arguments go to the benchmark program, e.g. --benchmark_filter=Binary.
set -euo pipefail
cd "$(dirname "$0")/.."
bash scripts/deps.sh >&2
# Warnings are not errors here: g++ 12 at -O3 reports false -Wrestrict findings in
# the standard library's string code; scripts/build.sh holds the code to -Werror.
cmake -S . -B build-bench -DCMAKE_BUILD_TYPE=Release -DVARNEL_WERROR=OFF -DVARNEL_BUILD_TESTS=OFF \
      -DVARNEL_BUILD_BENCHMARKS=ON >/dev/null
cmake --build build-bench -j"$(nproc)" --target varnel_bench >&2
exec build-bench/bin/varnel_bench --benchmark_repetitions=15 --benchmark_enable_random_interleaving=true \
     --benchmark_report_aggregates_only=true "$@"

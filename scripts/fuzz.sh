#!/usr/bin/env bash
# Builds the fuzz targets with clang (build-fuzz/) and runs each for the given
# number of seconds (default 600) on its seed corpus in fuzz/corpus/<target>/.
# New inputs go to build-fuzz/corpus/<target>/, findings to build-fuzz/findings/.
# Fails when any target finds a crash, a sanitizer report, a leak or a hang.
set -uo pipefail
cd "$(dirname "$0")/.."
seconds="${1:-600}"
targets=(settings_document load_xml readings profile replay)

bash scripts/deps.sh >&2 || exit 1
CC=clang CXX=clang++ cmake -S . -B build-fuzz -DCMAKE_BUILD_TYPE=RelWithDebInfo \
  -DVARNEL_BUILD_FUZZERS=ON -DVARNEL_BUILD_TESTS=OFF >/dev/null || exit 1
build_targets=()
for t in "${targets[@]}"; do build_targets+=(--target "fuzz_$t"); done
cmake --build build-fuzz -j"$(nproc)" "${build_targets[@]}" >&2 || exit 1

failed=()
for t in "${targets[@]}"; do
  mkdir -p "build-fuzz/corpus/$t" build-fuzz/findings
  echo "-- fuzz_$t for ${seconds}s"
  if ! ASAN_OPTIONS=detect_leaks=1 UBSAN_OPTIONS=print_stacktrace=1 \
      "build-fuzz/bin/fuzz_$t" "build-fuzz/corpus/$t" "fuzz/corpus/$t" \
      -max_total_time="$seconds" -timeout=30 -rss_limit_mb=4096 -print_final_stats=1 \
      -artifact_prefix="build-fuzz/findings/$t-" >"build-fuzz/findings/$t.log" 2>&1; then
    failed+=("$t")
    echo "fuzz_$t found a fault; its input is in build-fuzz/findings/:" >&2
    grep -E "ERROR|SUMMARY|LoadXML|runtime error|deadly signal|Test unit written" "build-fuzz/findings/$t.log" | head -20 >&2
  else
    grep -E "stat::number_of_executed_units|stat::peak_rss_mb" "build-fuzz/findings/$t.log"
  fi
done
echo "Fuzzing: $(( ${#targets[@]} - ${#failed[@]} )) passed, ${#failed[@]} failed"
if [ ${#failed[@]} -gt 0 ]; then
  echo "Fuzz targets with findings: ${failed[*]}" >&2
  exit 1
fi
